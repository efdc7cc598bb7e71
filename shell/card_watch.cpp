#include "shell/card_watch.h"

#include <chrono>

#include "shell/messages.h"
#include "support/local_socket.h"  // the card manager's message numbers
#include "support/lock_within.h"
#include "support/settings_store.h"

namespace vqm {

namespace {

constexpr int kBusyWaitMs = 500;
constexpr int kCompanionBusySleepMs = 5000;
constexpr int kViewWriteSms = 1, kViewSettings = 4;

}  // namespace

void BusyIndicator::BeginBusy() {
    if (!LockWithin(mutex_, kBusyWaitMs)) return;
    if (++count_ == 1) ui_.SetBusyLook(true);
    mutex_.unlock();
}

void BusyIndicator::EndBusy() {
    if (!LockWithin(mutex_, kBusyWaitMs)) return;
    if (count_ > 0 && --count_ == 0) ui_.SetBusyLook(false);
    mutex_.unlock();
}

int BusyIndicator::Count() const {
    std::lock_guard<std::mutex> lock(mutex_);
    return count_;
}

void CardWatch::Tick() {
    for (;;) {
        if (!card_.CompanionExists()) {
            SetCardState(1);
            break;
        }
        const long answer = card_.SendCompanion(kMsgCardPowerQuery).value_or(-1);
        if (answer == 2) {
            // Still powering up: wait and ask again, as the card manager expects. The wait runs
            // aside so that the window keeps painting and an exit meanwhile cuts it short.
            ui_.RunAside([this] {
                card_.Sleep(kCompanionBusySleepMs);
                return 1;
            });
            if (ui_.ShuttingDown()) return;
            continue;
        }
        if ((answer == 1 || (answer == 0 && PoweredUpOnRequest())) && ConnectIfReady()) return;
        break;
    }
    ShowAbsence();
}

bool CardWatch::PoweredUpOnRequest() {
    int32_t poweredDownByUser = 0;  // missing means 0
    GetSettingInt(settings_, u"DialPadPowerDown", &poweredDownByUser);
    if (app_.cardState == 2) {
        SetCardState(1);  // the card was lost
        return false;
    }
    if (app_.askPowerUp != 1 || poweredDownByUser != 0) return false;
    const int answer = ui_.MessageBox(
        u"Tavro Card Phone 2.0 is not powered up, would you like to power it up now?", kBoxTitle,
        kMbOkCancel | kMbIconQuestion | kMbTopmost);
    if (answer != kIdOk) {
        app_.askPowerUp = 0;
        return false;
    }
    ui_.UpdateWindow();
    // A card manager that refuses has no card to power: opening the port could only fail, and
    // the user is told the card is absent instead.
    return card_.SendCompanion(kMsgCardPowerUp) != 0L;
}

bool CardWatch::ConnectIfReady() {
    // The card manager may have gone while we asked.
    if (!card_.CompanionExists()) return false;
    if (app_.cardState == 2) return true;
    ui_.Foreground();
    busy_.BeginBusy();
    ui_.ShowStatus(u"Initializing...", u"");
    // That line replaces whichever absence was shown, so the next absence is shown again.
    app_.shownNoCard = app_.shownPoweredDown = 0;
    ui_.UpdateWindow();
    const int opened = ui_.RunAside([this] { return card_.OpenLink(); });
    busy_.EndBusy();
    if (ui_.ShuttingDown()) {
        if (opened) card_.CloseLink();  // the exit came while the card was being initialised
        return true;
    }
    if (opened) SetCardState(2);
    // A card pulled while it was being initialised is said to be gone at once.
    return opened || card_.CardPresent();
}

void CardWatch::ShowAbsence() {
    if (app_.cardState != 1) return;
    if (card_.CardPresent()) {
        if (!app_.shownPoweredDown) {
            ui_.ShowStatus(u"Card Phone is powered", u"down.");
            app_.shownPoweredDown = 1;
            app_.shownNoCard = 0;
        }
    } else if (!app_.shownNoCard) {
        ui_.ShowStatus(u"No Card Phone inserted.", u"");
        app_.shownNoCard = 1;
        app_.shownPoweredDown = 0;
    }
}

void CardWatch::SetCardState(int state) {
    if ((state != 1 && state != 2) || state == app_.cardState) return;
    app_.cardState = state;
    int icon;
    if (state == 2) {
        icon = kIconConnected;
        ui_.EnableViewButton(kViewWriteSms, true);
        ui_.EnableViewButton(kViewSettings, true);
    } else {
        icon = kIconNotConnected;
        card_.CloseLink();
        ui_.ShowDialPad();
        app_.shownPoweredDown = 0;
        app_.shownNoCard = 0;
        ui_.EnableViewButton(kViewWriteSms, false);
        ui_.EnableViewButton(kViewSettings, false);
    }
    ui_.SetTrayIcon(icon);
    ui_.SendToViews(kMsgCardStateChanged, 0, 0);
}

}  // namespace vqm
