// Runs exchanges with the card on a thread of its own, one after the other in the order they
// were handed in, so that the window that asks for them never waits for the port: it keeps
// painting and taking keys while the card answers, and hears of the results as messages.
#pragma once

#include <condition_variable>
#include <deque>
#include <functional>
#include <mutex>
#include <thread>

namespace vqm {

class CardWorker {
  public:
    CardWorker() = default;
    ~CardWorker();
    CardWorker(const CardWorker&) = delete;
    CardWorker& operator=(const CardWorker&) = delete;

    // Queues a job; the thread starts with the first one. Refused once stopping.
    void Post(std::function<void()> job);
    // Jobs not started yet are dropped; the running one finishes. Idle() tells when it has.
    void Stop();
    bool Idle();
    // Joins the thread once Idle(); call after Stop().
    void Join();

  private:
    void Run();

    std::mutex mutex_;
    std::condition_variable changed_;
    std::deque<std::function<void()>> jobs_;
    bool stopping_ = false;
    bool running_ = false;
    std::thread thread_;
};

}  // namespace vqm
