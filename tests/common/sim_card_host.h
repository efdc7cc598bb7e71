// The card manager's side for a test's main window: the link opens on the simulated card's
// device and closes while the window keeps taking the listener's messages (the listener may be
// waiting for the window's thread to take a ring; joining it there would wait for ever).
#pragma once

#include <atomic>
#include <optional>
#include <string>
#include <thread>

#include "link/link.h"
#include "shell/card_watch.h"
#include "shell/message_layer.h"
#include "shell/messages.h"
#include "support/local_socket.h"

namespace vqm::testing {

class SimCardHost : public CardHost {
  public:
    explicit SimCardHost(Link& link) : link_(link) {}
    bool CompanionExists() override { return companion; }
    std::optional<long> SendCompanion(unsigned msg) override {
        if (!companion) return std::nullopt;
        if (msg == kMsgCardPowerUp) power = 1;
        return msg == kMsgCardPowerQuery ? power : 1;
    }
    int OpenLink() override { return PortOpenDevice(link_, device.c_str()); }
    void CloseLink() override {
        if (!messages || !messages->OnOwnerThread()) return PortClose(link_);
        std::atomic<bool> closed{false};
        std::thread closer([&] {
            PortClose(link_);
            closed = true;
        });
        messages->WaitWhileDelivering([&] { return closed.load(); });
        closer.join();
    }
    int CardPresent() override { return 1; }
    void Sleep(int) override {}

    std::string device;
    MessageLayer* messages = nullptr;
    bool companion = false;  // the card manager is there
    long power = 1;          // its answer to the power query

  private:
    Link& link_;
};

}  // namespace vqm::testing
