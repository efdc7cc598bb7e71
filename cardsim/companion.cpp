#include "cardsim/companion.h"

#include "support/local_socket.h"

namespace vqm::cardsim {

long Companion::OnMessage(unsigned msg, long, long, Clock::time_point now) {
    std::lock_guard<std::mutex> lock(mutex_);
    TickLocked(now);
    switch (msg) {
        case kMsgCardPowerQuery:
            if (poweringUp_) return 2;
            return card_.Powered() ? 1 : 0;
        case kMsgSimFullCleared:
            ++simFullCleared_;
            return 1;
        case kMsgCardPowerUp:
            if (!card_.Inserted()) return 0;
            if (card_.Powered() || poweringUp_) return 1;
            if (powerUpMs_ <= 0) return card_.PowerUp() ? 1 : 0;
            poweringUp_ = true;
            poweredAt_ = now + std::chrono::milliseconds(powerUpMs_);
            return 1;
        case kMsgCardPowerDown:
            poweringUp_ = false;
            card_.PowerDown();
            return 1;
        default:
            return 0;
    }
}

void Companion::Tick(Clock::time_point now) {
    std::lock_guard<std::mutex> lock(mutex_);
    TickLocked(now);
}

void Companion::TickLocked(Clock::time_point now) {
    if (!poweringUp_) return;
    if (!card_.Inserted()) {
        poweringUp_ = false;  // pulled while it powered up
    } else if (now >= poweredAt_) {
        poweringUp_ = false;
        card_.PowerUp();
    }
}

int Companion::SimFullClearedCount() const {
    std::lock_guard<std::mutex> lock(mutex_);
    return simFullCleared_;
}

}  // namespace vqm::cardsim
