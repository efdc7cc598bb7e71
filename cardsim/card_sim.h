// The simulated card on a pseudo-terminal: the dialer opens DevicePath() as it would a real
// modem's serial port. While powered the card registers itself as an active serial driver.
#pragma once

#include <atomic>
#include <functional>
#include <mutex>
#include <string>
#include <thread>

#include "cardsim/card_engine.h"

namespace vqm::cardsim {

inline constexpr char kCardPnpId[] = "Tavro_Mobile_Phones-TAVRO_CARD_PHONE-4C2D";

inline constexpr char kControlHelp[] =
    "  ring NUMBER              a call from NUMBER rings the card\n"
    "  caller-hangup            the caller gives up before it is answered\n"
    "  remote-answer            the far end answers the card's call\n"
    "  remote-hangup            the far end ends the call\n"
    "  local-answer             the call is answered on the card's own controls\n"
    "  busy|unanswered|reachable NUMBER   how the network treats calls to NUMBER\n"
    "  signal N                 signal quality 0..31, 99 unknown\n"
    "  operator CODE            the registered network, e.g. 20201\n"
    "  firmware VERSION         e.g. SW3.80 (caller number unquoted) or SW4.00\n"
    "  silent on|off            the card stops answering, or answers again\n"
    "  hold TEXT                the card takes the next command containing TEXT and then\n"
    "                           answers nothing, as silent on (status shows held=1), until\n"
    "                           silent off or a loss of power\n"
    "  garbage N                N random bytes on the line\n"
    "  unsolicited TEXT         the line TEXT from the card now (e.g. \"^RSSI: 3\")\n"
    "  inject N TEXT            the line TEXT at byte N of the next exchange: the next\n"
    "                           command as typed, then its reply (standard dialect: moved\n"
    "                           on to the end of a reply line; card: after the reply)\n"
    "  pull | insert            take the card out (it powers down, its call dropped) or\n"
    "                           put it back\n"
    "  power-up | power-down    as the card manager does\n"
    "  status                   one line: power, call, signal, operator, firmware, volume,\n"
    "                           device, dialect\n";

struct SimConfig {
    int baud = 19200;        // output paced at 10 bits a byte; 0 sends at once
    std::string runtimeDir;  // Drivers/Active/<key>/ goes here; empty registers nothing
    std::string driverKey = "vqm-cardsim";
    std::string stateFile;  // the card's kept state between runs; empty keeps nothing
    EngineConfig engine;
};

class CardSim {
  public:
    explicit CardSim(SimConfig config);
    ~CardSim();
    CardSim(const CardSim&) = delete;
    CardSim& operator=(const CardSim&) = delete;

    // Powering up fails while the card is pulled out.
    bool PowerUp();
    void PowerDown();
    bool Powered() const;
    bool Inserted() const { return inserted_; }
    std::string DevicePath() const;

    // kControlHelp and the help of every command group.
    static std::string ControlHelp();

    // One control command from the network side ("ring +441234", "busy 0123", "signal 7",
    // "pull", ...; kControlHelp lists them). Returns "OK", "OK <status>" or "ERROR: reason".
    std::string Control(const std::string& line);
    // A script of control commands, one a line, with "wait MS" and "#" comments. Stops at
    // the first error and returns it with its line number; "OK" when every line worked.
    std::string RunScript(const std::string& script,
                          const std::function<void(int ms)>& wait = nullptr);

  private:
    void Run();
    void Register();
    void Unregister();
    std::string ControlEngine(const std::string& command, const std::string& argument);
    std::string ControlLine(const std::string& command, const std::string& rest);
    std::string Status() const;
    void LoadState();
    void SaveState();  // with mutex_ held

    SimConfig config_;
    CardEngine engine_;
    mutable std::mutex mutex_;  // guards the engine and the descriptors
    // Held for a whole power-up or power-down: the control socket, a script and the card
    // manager may switch the power at the same moment, and only one may start or join the
    // card's thread.
    std::mutex powerMutex_;
    int master_ = -1;
    std::string slavePath_;
    std::thread worker_;
    std::atomic<bool> stop_{false};
    std::atomic<bool> inserted_{true};
    unsigned long savedRevision_ = 0;
};

}  // namespace vqm::cardsim
