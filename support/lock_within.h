// Waiting a bounded time for a mutex that others hold only for an instant.
#pragma once

#include <chrono>
#include <mutex>
#include <thread>

namespace vqm {

// A plain try-and-retry rather than a timed mutex, whose clock-based wait the thread sanitizer
// cannot follow. True when the caller now holds the mutex.
inline bool LockWithin(std::mutex& mutex, int ms) {
    const auto deadline = std::chrono::steady_clock::now() + std::chrono::milliseconds(ms);
    while (!mutex.try_lock()) {
        if (std::chrono::steady_clock::now() >= deadline) return false;
        std::this_thread::sleep_for(std::chrono::microseconds(200));
    }
    return true;
}

}  // namespace vqm
