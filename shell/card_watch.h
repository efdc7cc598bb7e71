// The once-a-second card watch, the card state and the busy indicator: the main window's
// logic, apart from its widgets. The window implements ShellUi; CardHost reaches the card
// manager and the card. Tests put scripted versions of both in their place.
#pragma once

#include <functional>
#include <mutex>
#include <optional>
#include <string>
#include <thread>

namespace vqm {

class SettingsStore;

// The application-wide state the main window's thread owns.
struct AppState {
    int cardState = 0;  // 0 not yet known, 1 not connected, 2 link open and initialised
    int shownPoweredDown = 0;
    int shownNoCard = 0;
    int askPowerUp = 1;
    int displayPowerSupported = 0;
    int displayOff = 0;
};

class ShellUi {
  public:
    virtual ~ShellUi() = default;
    virtual int MessageBox(const std::u16string& text, const std::u16string& title,
                           unsigned style) = 0;
    virtual void ShowStatus(const std::u16string& first, const std::u16string& second) = 0;
    virtual void Foreground() = 0;
    virtual void UpdateWindow() = 0;
    // The main window disabled with the wait cursor, or back to normal. Any thread.
    virtual void SetBusyLook(bool busy) = 0;
    virtual void SetTrayIcon(int icon) = 0;
    virtual void EnableViewButton(int index, bool enable) = 0;
    // Checks the DialPad button, makes DialPad current and shows it.
    virtual void ShowDialPad() = 0;
    // Sends the message to the seven views in table order.
    virtual void SendToViews(unsigned msg, long wParam, long lParam) = 0;
    // Runs work that holds the card for seconds (the link's opening) and returns its result;
    // a window runs it on a helper thread and keeps painting meanwhile.
    virtual int RunAside(const std::function<int()>& work) { return work(); }
    // The program is on its way out (an exit came while work ran aside).
    virtual bool ShuttingDown() const { return false; }
};

class CardHost {
  public:
    virtual ~CardHost() = default;
    virtual bool CompanionExists() = 0;
    // The card manager's answer; nothing when it does not answer.
    virtual std::optional<long> SendCompanion(unsigned msg) = 0;
    virtual int OpenLink() = 0;  // opens and initialises the serial link: 1 or 0
    virtual void CloseLink() = 0;
    virtual int CardPresent() = 0;
    // Waits ms, or less once StopWaiting was called (from any thread).
    virtual void Sleep(int ms) = 0;
    virtual void StopWaiting() {}
};

// A nesting busy indicator that worker threads may use too.
class BusyIndicator {
  public:
    explicit BusyIndicator(ShellUi& ui) : ui_(ui) {}
    void BeginBusy();
    void EndBusy();
    int Count() const;

  private:
    ShellUi& ui_;
    mutable std::mutex mutex_;
    int count_ = 0;
};

class CardWatch {
  public:
    CardWatch(AppState& app, SettingsStore& settings, ShellUi& ui, CardHost& card,
              BusyIndicator& busy)
        : app_(app), settings_(settings), ui_(ui), card_(card), busy_(busy) {}

    // One pass of the watch; the caller stops the timer before and re-arms it after.
    void Tick();
    // Only 1 and 2 are states; the current state again changes nothing.
    void SetCardState(int state);

  private:
    bool PoweredUpOnRequest();  // for a powered-down card: true when asked to power up
    bool ConnectIfReady();      // false when the card manager has gone meanwhile
    void ShowAbsence();         // step 5

    AppState& app_;
    SettingsStore& settings_;
    ShellUi& ui_;
    CardHost& card_;
    BusyIndicator& busy_;
};

}  // namespace vqm
