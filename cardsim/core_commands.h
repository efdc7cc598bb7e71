// The card's core queries and settings as a command group of their own: identity (+GMI, +GMM,
// +GMR, +GSN and their +C forms), the radio (+CFUN, +CIMI), signal (+CSQ), operator (+COPS? and,
// on a standard modem, the format chosen with +COPS=3,<format>), speaker volume (+CLVL) and the
// call list (+CLCC). The calls themselves (ATD, ATA, ATH, +VTS) live in the engine, whose call
// state this group only reads. Adding a query is one place: Run below.
#pragma once

#include <string>

#include "cardsim/command_set.h"

namespace vqm::cardsim {

class CoreCommands : public CommandSet {
  public:
    Handled Run(const std::string& upper, const std::string& original, std::string& info,
                std::string& errorText) override;
    void Save(std::ostream& out) const override;
    bool Load(const std::string& name, const std::string& rest) override;

    int Volume() const { return volume_; }
    void SetVolume(int level);
    // 0 long name, 1 short name, 2 numeric: how "+COPS?" names the network on a standard modem.
    int OperatorFormat() const { return operatorFormat_; }

  private:
    int volume_ = 5;
    int operatorFormat_ = 0;
};

// The name a standard modem gives a network in "+COPS?" (alphanumeric format).
std::string OperatorName(int code);

}  // namespace vqm::cardsim
