#include "shell/card_host.h"

#include <atomic>
#include <chrono>
#include <thread>

#include "link/ports.h"
#include "shell/message_layer.h"
#include "support/local_socket.h"

namespace vqm {

bool LinkCardHost::CompanionExists() {
    return ServerAnswers(companionPath_);
}

std::optional<long> LinkCardHost::SendCompanion(unsigned msg) {
    return SendWindowMessage(companionPath_, msg, 0, 0);
}

int LinkCardHost::OpenLink() {
    return PortOpen(link_);
}

void LinkCardHost::CloseLink() {
    if (!messages_ || !messages_->OnOwnerThread()) {
        PortClose(link_);
        return;
    }
    // The listener may be waiting for this thread to take its message; keep delivering while
    // the port closes and the listener is joined.
    std::atomic<bool> closed{false};
    std::thread closer([&] {
        PortClose(link_);
        closed = true;
    });
    messages_->WaitWhileDelivering([&] { return closed.load(); });
    closer.join();
}

int LinkCardHost::CardPresent() {
    return vqm::CardPresent(link_.settings, link_.roots);
}

void LinkCardHost::Sleep(int ms) {
    std::unique_lock<std::mutex> lock(stopMutex_);
    stopped_.wait_for(lock, std::chrono::milliseconds(ms), [this] { return stopping_; });
}

void LinkCardHost::StopWaiting() {
    {
        std::lock_guard<std::mutex> lock(stopMutex_);
        stopping_ = true;
    }
    stopped_.notify_all();
}

}  // namespace vqm
