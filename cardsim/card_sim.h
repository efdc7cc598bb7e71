// The simulated card on a pseudo-terminal: the dialer opens DevicePath() as it would a real
// modem's serial port. While powered the card registers itself as an active serial driver.
#pragma once

#include <atomic>
#include <mutex>
#include <string>
#include <thread>

#include "cardsim/card_engine.h"

namespace vqm::cardsim {

inline constexpr char kCardPnpId[] = "Tavro_Mobile_Phones-TAVRO_CARD_PHONE-4C2D";

struct SimConfig {
    int baud = 19200;        // output paced at 10 bits a byte; 0 sends at once
    std::string runtimeDir;  // Drivers/Active/<key>/ goes here; empty registers nothing
    std::string driverKey = "vqm-cardsim";
    EngineConfig engine;
};

class CardSim {
  public:
    explicit CardSim(SimConfig config);
    ~CardSim();
    CardSim(const CardSim&) = delete;
    CardSim& operator=(const CardSim&) = delete;

    bool PowerUp();
    void PowerDown();
    bool Powered() const { return master_ >= 0; }
    std::string DevicePath() const;

    // One control command from the network side ("ring +441234", "busy 0123", "signal 7",
    // "pull", ...). Returns "OK" or "ERROR: reason".
    std::string Control(const std::string& line);

  private:
    void Run();
    void Register();
    void Unregister();

    SimConfig config_;
    CardEngine engine_;
    mutable std::mutex mutex_;  // guards the engine and the descriptors
    int master_ = -1;
    std::string slavePath_;
    std::thread worker_;
    std::atomic<bool> stop_{false};
};

}  // namespace vqm::cardsim
