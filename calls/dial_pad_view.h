// The DialPad view (DIALPAD_VIEW, view 0): the phone's face, painted by the program itself,
// whose keys, slider and texts carry the ids the rest of the program addresses them by. The
// logic is DialPad's; this file draws and hands the window messages over.
#pragma once

#include <QLabel>
#include <QPixmap>
#include <QTimer>
#include <map>
#include <memory>
#include <string>

#include "calls/call_log.h"
#include "calls/dial_pad.h"
#include "calls/event_log.h"
#include "calls/ring_player.h"
#include "calls/unsolicited.h"
#include "contacts/phonebook_cache.h"
#include "shell/main_window.h"
#include "shell/views.h"

class QLabel;
class QSlider;

namespace vqm {

// A read-only text of the pad whose font shrinks, down to a floor, until the whole text fits
// its width: a status or a 19-digit number is never cut. Set through setText like any label.
class FittedText : public QLabel {
  public:
    using QLabel::QLabel;
    QFont ShownFont() const;

  protected:
    void paintEvent(QPaintEvent* event) override;
};

class DialPadView : public View, public DialPadUi {
  public:
    // callLog and caches are the program's shared ones when given; otherwise the view keeps
    // its own over the same files. The view queues the card's unsolicited codes for the link
    // (when nobody else does) and answers the ring and caller-id rows.
    DialPadView(QWidget* parent, ShellContext& context, CallLog* callLog = nullptr,
                PhonebookCaches* caches = nullptr);
    ~DialPadView() override;

    long OnMessage(unsigned msg, long wParam, long lParam) override;

    int Dial(const std::u16string& number) { return pad_.Dial(number); }
    DialPad& Pad() { return pad_; }
    RingPlayer& Ring() { return ring_; }
    UnsolicitedEvents& Events() { return *events_; }
    int SignalBars() const { return bars_; }
    bool NotificationIconShown() const { return iconShown_; }
    // How often a key was refused because the number is full, and whether the display still
    // shows it.
    int FullNumberSignals() const { return fullSignals_; }
    bool DisplayFlashing() const { return flashing_; }

    // DialPadUi
    void SetControlText(int id, const std::u16string& text) override;
    std::u16string ControlText(int id) override;
    void EnableControl(int id, bool enable) override;
    bool ControlEnabled(int id) override;
    void SetSliderPosition(int position) override;
    int SliderPosition() override;
    void SetSignalBars(int bars) override;
    void ShowNotificationIcon(bool show) override;
    void StartTimer(int id, int ms) override;
    void StopTimer(int id) override;
    void SwitchToView(int index) override;
    void ShowDialPad() override;
    void BringDialPadForward() override;
    void ShowStatus(const std::u16string& first, const std::u16string& second) override;
    void DisplayOnIfOff() override;
    void PostNotification(const std::u16string& body, const std::u16string& sound) override;
    void StartRingTone() override;
    void StopRingTone() override;
    bool CompanionExists() override;
    std::optional<long> SendCompanion(unsigned msg) override;
    long SendToDialPad(unsigned msg, long wParam, long lParam) override;
    void PostToDialPad(unsigned msg, long wParam, long lParam) override;
    void WaitWhileDelivering(const std::function<bool()>& done) override;

  protected:
    void paintEvent(QPaintEvent* event) override;
    void mousePressEvent(QMouseEvent* event) override;
    void keyPressEvent(QKeyEvent* event) override;
    void changeEvent(QEvent* event) override;

  private:
    void BuildControls();
    // A key of the pad, clicked or typed.
    void PressKey(int id);
    void SignalNumberFull();
    // Whenever the pad is in front and usable, typing reaches it.
    void TakeFocus();
    MessageLayer& Messages();
    void RunOnPadThread(const std::function<void()>& work);

    ShellContext& context_;
    std::unique_ptr<CallLog> ownCallLog_;
    std::unique_ptr<PhonebookCaches> ownCaches_;
    std::unique_ptr<MessageLayer> ownMessages_;
    EventLog eventLog_;
    std::unique_ptr<UnsolicitedEvents> events_;
    bool ownsLinkEvents_ = false;
    RingPlayer ring_;
    std::map<int, QTimer*> timers_;
    QSlider* slider_ = nullptr;
    QPixmap background_, gauge_;
    int bars_ = 0;
    bool iconShown_ = false;
    int fullSignals_ = 0;
    bool flashing_ = false;
    DialPad pad_;  // last: it may call back into everything above while it goes
};

// Places a call from any view: brings the DialPad forward and dials. 0 when the DialPad is not
// there or a call is under way.
int DialFromAnywhere(ShellContext& context, const std::u16string& number);

}  // namespace vqm
