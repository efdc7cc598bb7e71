// The card manager's side of the simulated card: it owns the card's power and answers the
// dialer's window messages about it (the power query, power up and down, SIM-full cleared).
#pragma once

#include <mutex>

#include "cardsim/card_sim.h"

namespace vqm::cardsim {

class Companion {
  public:
    // A power-up takes powerUpMs, during which the power query answers 2.
    Companion(CardSim& card, int powerUpMs) : card_(card), powerUpMs_(powerUpMs) {}

    long OnMessage(unsigned msg, long wParam, long lParam, Clock::time_point now);
    // Finishes a power-up whose time has come.
    void Tick(Clock::time_point now);
    int SimFullClearedCount() const;

  private:
    void TickLocked(Clock::time_point now);

    CardSim& card_;
    const int powerUpMs_;
    mutable std::mutex mutex_;
    bool poweringUp_ = false;
    Clock::time_point poweredAt_{};
    int simFullCleared_ = 0;
};

}  // namespace vqm::cardsim
