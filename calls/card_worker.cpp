#include "calls/card_worker.h"

namespace vqm {

CardWorker::~CardWorker() {
    Stop();
    Join();
}

void CardWorker::Post(std::function<void()> job) {
    std::lock_guard<std::mutex> lock(mutex_);
    if (stopping_) return;
    jobs_.push_back(std::move(job));
    if (!thread_.joinable()) thread_ = std::thread([this] { Run(); });
    changed_.notify_all();
}

void CardWorker::Stop() {
    std::lock_guard<std::mutex> lock(mutex_);
    stopping_ = true;
    jobs_.clear();
    changed_.notify_all();
}

bool CardWorker::Idle() {
    std::lock_guard<std::mutex> lock(mutex_);
    return !running_ && jobs_.empty();
}

void CardWorker::Join() {
    if (thread_.joinable()) thread_.join();
}

void CardWorker::Run() {
    std::unique_lock<std::mutex> lock(mutex_);
    for (;;) {
        changed_.wait(lock, [this] { return stopping_ || !jobs_.empty(); });
        if (jobs_.empty()) return;  // stopping, nothing left
        std::function<void()> job = std::move(jobs_.front());
        jobs_.pop_front();
        running_ = true;
        lock.unlock();
        job();
        lock.lock();
        running_ = false;
        changed_.notify_all();
    }
}

}  // namespace vqm
