// The one way tests wait for something to happen: poll a condition until it holds or the time
// is up. Every wait is bounded; the caller asserts on the result, so a fault fails the test
// instead of hanging it. A test with a Qt event loop passes a condition that also runs the
// loop (see PumpingFor).
#pragma once

#include <chrono>
#include <thread>

namespace vqm::testing {

template <typename Condition>
bool WaitFor(Condition condition,
             std::chrono::milliseconds limit = std::chrono::milliseconds(5000)) {
    const auto end = std::chrono::steady_clock::now() + limit;
    while (!condition()) {
        if (std::chrono::steady_clock::now() > end) return false;
        std::this_thread::sleep_for(std::chrono::milliseconds(5));
    }
    return true;
}

// The condition with an event-loop step before each look: pump is the loop's step, e.g.
// [] { QCoreApplication::processEvents(QEventLoop::AllEvents, 20); }. Kept free of Qt so the
// Qt-less tests share this header.
template <typename Pump, typename Condition>
auto PumpingFor(Pump pump, Condition condition) {
    return [pump, condition]() mutable {
        pump();
        return condition();
    };
}

}  // namespace vqm::testing
