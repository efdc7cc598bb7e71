// The simulated card's network services: operator search and registration, call forwarding,
// call barring and the SIM's facility locks with their passwords, and the data bearer and HSCSD
// parameters of data calls.
#pragma once

#include <array>
#include <string>
#include <vector>

#include "cardsim/command_set.h"

namespace vqm::cardsim {

class NetworkServices : public CommandSet {
  public:
    NetworkServices() { FillDemo(); }

    Handled Run(const std::string& upper, const std::string& original, std::string& info,
                std::string& errorText) override;
    std::string Control(const std::string& command, const std::string& rest) override;
    std::string ControlHelp() const override;
    void Save(std::ostream& out) const override;
    bool Load(const std::string& name, const std::string& rest) override;
    // Four networks (COSMOTE current, two more available, one forbidden), SIM PIN "1234",
    // PIN2 "5678", security code "12345", barring password "0000", no forwarding or barring,
    // three tries left for each PIN.
    void FillDemo() override;

    // Network-side status: 1 available, 2 current, 3 forbidden (0 unknown).
    struct Network {
        int code;
        int status;
    };
    struct Forward {
        bool active = false;
        std::string number;  // empty: nothing registered
        int type = 129;
        int seconds = 20;
    };

    static constexpr int kReasons = 4;   // unconditional, busy, no reply, not reachable
    static constexpr int kClasses = 3;   // voice, data, fax: class bits 1, 2, 4
    static constexpr int kBarrings = 5;  // AO, OI, OX, AI, IR
    static constexpr int kLocks = 3;     // SC, P2, PS
    static constexpr int kPinTries = 3;  // wrong PINs in a row before the SIM asks for its PUK

    // Tries left for the PIN (0) and PIN2 (1); 0 is a blocked code.
    int TriesLeft(int pin) const { return tries_[pin]; }

  private:
    Handled RunCops(const std::string& args, bool query, std::string& info, std::string& errorText);
    Handled RunCcfc(const std::string& args, std::string& info, std::string& errorText);
    Handled RunClck(const std::string& args, std::string& info, std::string& errorText);
    Handled RunCpwd(const std::string& args, std::string& errorText);
    int CurrentCode() const;
    std::string& PasswordFor(int lockOrBarring);
    // Checks a PIN or PIN2 given for lock: counts a wrong one against its tries. Handled::Ok
    // when it matches; otherwise the refusal is in errorText.
    Handled CheckPin(int lock, const std::string& given, std::string& errorText);

    std::vector<Network> networks_;
    std::array<std::array<Forward, kClasses>, kReasons> forwards_{};
    std::array<int, kBarrings> barred_{};  // class bits barred per facility
    std::array<bool, kLocks> locked_{};
    std::array<std::string, kLocks> codes_;  // PIN, PIN2, security code
    std::string barringPassword_;
    std::array<int, 2> tries_{kPinTries, kPinTries};
    std::array<int, 3> bearer_{};  // +CBST speed, name, connection element
    std::array<int, 4> hscsd_{};   // +CHSN air rate, wanted channels, top channels, codings
};

}  // namespace vqm::cardsim
