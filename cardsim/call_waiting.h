// The simulated card's call waiting ("+CCWA"): the network's setting per service class, kept
// with the card's state, and the second caller it lets through during a call. The card itself
// always announces a waiting caller; a standard modem only after "+CCWA=1" asked it to.
#pragma once

#include <string>

#include "cardsim/command_set.h"

namespace vqm::cardsim {

class CallWaiting : public CommandSet {
  public:
    CallWaiting() { FillDemo(); }

    Handled Run(const std::string& upper, const std::string& original, std::string& info,
                std::string& errorText) override;
    // "ring NUMBER" during an active call is this group's while waiting is on for voice; at any
    // other time it is left to the engine (which refuses it during a call). "call-waiting"
    // reports the setting and the last "+CCWA" command the card was sent ("OK on
    // last=+CCWA=1,2,1"), "call-waiting on|off" changes it from the network side, and
    // "call-waiting none" takes the service off the subscription: every +CCWA command is then
    // refused until it is switched on or off again.
    std::string Control(const std::string& command, const std::string& rest) override;
    std::string ControlHelp() const override;
    void Save(std::ostream& out) const override;
    bool Load(const std::string& name, const std::string& rest) override;
    // Off for every class, as on a new subscription.
    void FillDemo() override {
        classes_ = 0;
        subscribed_ = true;
    }

    // Class bits (1 voice, 2 data, 4 fax) with waiting on.
    int Classes() const { return classes_; }
    bool Presenting() const;

  private:
    int classes_ = 0;
    bool subscribed_ = true;
    bool presentation_ = false;  // "+CCWA=1" was sent
    std::string last_;           // the last "+CCWA" command as sent, for the network side to see
};

}  // namespace vqm::cardsim
