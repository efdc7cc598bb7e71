// A card manager and card that answer as a test scripts them, for the shell's tests that need
// no real card: the power-query answers in turn, whether the link opens, and a record of what
// was asked.
#pragma once

#include <deque>
#include <optional>
#include <vector>

#include "shell/card_watch.h"
#include "shell/messages.h"
#include "support/local_socket.h"

namespace vqm::testing {

class ScriptedCardHost : public CardHost {
  public:
    bool CompanionExists() override { return companion; }
    std::optional<long> SendCompanion(unsigned msg) override {
        sent.push_back(msg);
        if (msg == kMsgCardPowerUp) return powerUpAnswer;
        if (msg != kMsgCardPowerQuery) return 1;
        if (answers.empty()) return answer;
        const long next = answers.front();
        answers.pop_front();
        return next;
    }
    int OpenLink() override { return ++opens, openWorks; }
    void CloseLink() override { ++closes; }
    int CardPresent() override { return present; }
    void Sleep(int ms) override { sleeps.push_back(ms); }

    bool companion = true;
    long answer = 0;           // to the power query once answers is used up
    std::deque<long> answers;  // taken first, in order
    long powerUpAnswer = 1;    // to a power-up request: 0 refuses it (no card in the slot)
    int openWorks = 1, opens = 0, closes = 0, present = 1;
    std::vector<unsigned> sent;
    std::vector<int> sleeps;
};

}  // namespace vqm::testing
