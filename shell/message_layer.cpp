#include "shell/message_layer.h"

#include <chrono>

namespace vqm {

long MessageLayer::Send(MessageTarget* target, unsigned msg, long wParam, long lParam) {
    if (!target) return 0;
    if (OnOwnerThread()) return target->OnMessage(msg, wParam, lParam);
    Pending pending{target, msg, wParam, lParam, true};
    {
        std::unique_lock<std::mutex> lock(mutex_);
        if (closed_) return 0;
        queue_.push_back(&pending);
        changed_.notify_all();  // an owner waiting in WaitWhileDelivering picks it up
    }
    if (wake_) wake_();
    std::unique_lock<std::mutex> lock(mutex_);
    changed_.wait(lock, [&] { return pending.done; });
    return pending.result;
}

void MessageLayer::Post(MessageTarget* target, unsigned msg, long wParam, long lParam) {
    if (!target) return;
    {
        std::lock_guard<std::mutex> lock(mutex_);
        if (closed_) return;
        queue_.push_back(new Pending{target, msg, wParam, lParam, false});
        changed_.notify_all();
    }
    if (wake_) wake_();
}

void MessageLayer::DeliverPending() {
    for (;;) {
        Pending* pending;
        {
            std::lock_guard<std::mutex> lock(mutex_);
            if (queue_.empty()) return;
            pending = queue_.front();
            queue_.pop_front();
        }
        const long result =
            pending->target->OnMessage(pending->msg, pending->wParam, pending->lParam);
        if (!pending->waited) {
            delete pending;
            continue;
        }
        std::lock_guard<std::mutex> lock(mutex_);
        pending->result = result;
        pending->done = true;
        changed_.notify_all();
    }
}

void MessageLayer::WaitWhileDelivering(const std::function<bool()>& done) {
    while (!done()) {
        DeliverPending();
        std::unique_lock<std::mutex> lock(mutex_);
        changed_.wait_for(lock, std::chrono::milliseconds(5), [&] { return !queue_.empty(); });
    }
    DeliverPending();
}

void MessageLayer::Close() {
    std::lock_guard<std::mutex> lock(mutex_);
    closed_ = true;
    for (Pending* pending : queue_) {
        if (pending->waited) {
            pending->done = true;  // result stays 0: the window is gone
        } else {
            delete pending;
        }
    }
    queue_.clear();
    changed_.notify_all();
}

}  // namespace vqm
