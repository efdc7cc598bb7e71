// The one way tests wait for something to happen: poll a condition until it holds or the time
// is up. Every wait is bounded; the caller asserts on the result, so a fault fails the test
// instead of hanging it. A test with a Qt event loop waits with WaitPumping, which keeps the
// loop running meanwhile (built only where Qt is linked, so the Qt-less tests share this header).
#pragma once

#include <chrono>
#include <thread>

#if defined(QT_CORE_LIB)
#include <QCoreApplication>
#endif

namespace vqm::testing {

// The default limit is far above any honest wait, which ends as soon as its condition holds:
// CI runs two tests a core, under sanitizers, and a card's reply can then take seconds.
template <typename Condition>
bool WaitFor(Condition condition,
             std::chrono::milliseconds limit = std::chrono::milliseconds(15000)) {
    const auto end = std::chrono::steady_clock::now() + limit;
    while (!condition()) {
        if (std::chrono::steady_clock::now() > end) return false;
        std::this_thread::sleep_for(std::chrono::milliseconds(5));
    }
    return true;
}

// The condition with an event-loop step before each look.
template <typename Pump, typename Condition>
auto PumpingFor(Pump pump, Condition condition) {
    return [pump, condition]() mutable {
        pump();
        return condition();
    };
}

#if defined(QT_CORE_LIB)
// WaitFor while the window keeps taking its events (a worker's sends, timers, repaints).
template <typename Condition>
bool WaitPumping(Condition condition,
                 std::chrono::milliseconds limit = std::chrono::milliseconds(20000)) {
    return WaitFor(
        PumpingFor([] { QCoreApplication::processEvents(QEventLoop::AllEvents, 20); },
                   condition),
        limit);
}
#endif

}  // namespace vqm::testing
