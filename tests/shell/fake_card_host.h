// A card manager that answers as a test tells it to, for main-window tests that need no card.
#pragma once

#include <optional>

#include "shell/card_watch.h"
#include "shell/messages.h"
#include "support/local_socket.h"

namespace vqm::testing {

class FakeCardHost : public CardHost {
  public:
    bool CompanionExists() override { return true; }
    std::optional<long> SendCompanion(unsigned msg) override {
        return msg == kMsgCardPowerQuery ? answer : 1;
    }
    int OpenLink() override { return 1; }
    void CloseLink() override {}
    int CardPresent() override { return present; }
    void Sleep(int) override {}
    long answer = 0;
    int present = 1;
};

}  // namespace vqm::testing
