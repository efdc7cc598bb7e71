// The DialPad's logic: the call state, the number being typed, the voice-call AT commands, the
// dial thread, and what the keys, the timers, the listener's call-list news and the card state
// do to them. No Qt here: the view implements DialPadUi and hands its window messages over.
#pragma once

#include <atomic>
#include <chrono>
#include <cstddef>
#include <functional>
#include <mutex>
#include <optional>
#include <string>
#include <thread>

#include "calls/alerts.h"
#include "calls/card_worker.h"
#include "link/voice_at.h"

namespace vqm {

struct CallLog;
struct Link;
struct PhonebookCaches;
class SettingsStore;

// Call states.
inline constexpr int kCallIdle = 0, kCallDialing = 1, kCallVoice = 2, kCallEnded = 3,
                     kCallRinging = 4;

// Controls of the DialPad.
inline constexpr int kKeyZeroId = 1126;  // "0".."9" are 1126..1135 (character = id - 1078)
inline constexpr int kKeyStarId = 1136, kKeyHashId = 1137, kKeyCallId = 1138, kKeyEndId = 1139,
                     kKeyClearId = 1140, kKeyContactsId = 1141;
// The card power button at the top left; the one id of the pad left free for it.
inline constexpr int kPowerKeyId = 1142;
inline constexpr int kVolumeSliderId = 1143;
inline constexpr int kStatusLine1Id = 1144, kStatusLine2Id = 1145, kStatusLine3Id = 1146;
inline constexpr int kNotificationLineId = 1147, kNumberDisplayId = 1148;

inline constexpr int kTimerDialPad = 1001, kTimerPowerKey = 1002;
// What the DialPad's card worker reports back: the timed poll (wParam the signal bars or -1,
// lParam 1 when an operator name was read), a volume change (wParam the card's result, lParam
// the level), the answer to a ring (wParam the final result).
inline constexpr unsigned kMsgPollRead = 2141, kMsgVolumeSet = 2142, kMsgAnswerResult = 2143;
inline constexpr unsigned kWmHScroll = 276;
// Track-bar notification codes the slider acts on: below 4 (line and page steps) or 8.
inline constexpr int kTbEndTrack = 8;
// What the power button reports (WM_LBUTTONDOWN / WM_LBUTTONUP of its subclass).
inline constexpr unsigned kWmLButtonUp = 514;

inline constexpr int kMaxVolumeLevel = 10, kDefaultVolumeLevel = 4;
inline constexpr int kSignalRefreshTicks = 30;
inline constexpr int kResultShowMs = 2001;
inline constexpr int kDoubleZeroMs = 1000;

using SteadyNow = std::function<std::chrono::steady_clock::time_point()>;

// The number being typed: slots 1 to count - 1 hold the text, so an empty buffer has count 1.
struct DialNumber {
    int count = 1;
    char16_t chars[21] = {};
    std::chrono::steady_clock::time_point lastZero{};
};

// Appends c. A "0" typed less than 1000 ms after a buffer's lone first "0" turns it into "+";
// anywhere else "00" stays "00". At most 19 characters are ever held: the append that would
// make the 20th is taken back. Returns 1 when the buffer changed, 0 when it was full.
int DialPadAppend(DialNumber& number, char16_t c, std::chrono::steady_clock::time_point now);
// Removes the last character: 1, or 0 when the buffer was empty.
int DialPadBackspace(DialNumber& number);
std::u16string DialPadText(const DialNumber& number);
void DialPadEmpty(DialNumber& number);

// What the logic needs from the view and the main window.
class DialPadUi {
  public:
    virtual ~DialPadUi() = default;
    virtual void SetControlText(int id, const std::u16string& text) = 0;
    virtual std::u16string ControlText(int id) = 0;
    // Keys 1126..1141 and the slider.
    virtual void EnableControl(int id, bool enable) = 0;
    virtual bool ControlEnabled(int id) = 0;
    virtual void SetSliderPosition(int position) = 0;
    virtual int SliderPosition() = 0;
    virtual void SetSignalBars(int bars) = 0;
    // Icon 106 at the notification spot, shown or hidden.
    virtual void ShowNotificationIcon(bool show) = 0;
    virtual void StartTimer(int id, int ms) = 0;
    virtual void StopTimer(int id) = 0;

    // The main window: switch to a view (its menu-bar button checked), bring the window and
    // the DialPad forward, the two-line status, the display.
    virtual void SwitchToView(int index) = 0;
    // Checks the DialPad button, makes DialPad current and shows it.
    virtual void ShowDialPad() = 0;
    virtual void BringDialPadForward() = 0;
    virtual void ShowStatus(const std::u16string& first, const std::u16string& second) = 0;
    virtual void DisplayOnIfOff() = 0;
    // The desktop notification (id 2002); body is the html text, sound may be empty.
    virtual void PostNotification(const std::u16string& body, const std::u16string& sound) = 0;

    virtual void StartRingTone() = 0;
    virtual void StopRingTone() = 0;

    // The card manager.
    virtual bool CompanionExists() = 0;
    virtual std::optional<long> SendCompanion(unsigned msg) = 0;

    // Any thread: delivers the message to the DialPad on its own thread and waits, as
    // SendMessage did (the dial thread's 2125).
    virtual long SendToDialPad(unsigned msg, long wParam, long lParam) = 0;
    // Any thread: queues the message for the DialPad's thread without waiting.
    virtual void PostToDialPad(unsigned msg, long wParam, long lParam) = 0;
    // The DialPad's thread: waits until done() holds, delivering other threads' sends meanwhile.
    virtual void WaitWhileDelivering(const std::function<bool()>& done) = 0;
};

class DialPad {
  public:
    DialPad(Link& link, SettingsStore& settings, CallLog& callLog, PhonebookCaches& caches,
            DialPadUi& ui, SteadyNow now = std::chrono::steady_clock::now);
    ~DialPad();
    DialPad(const DialPad&) = delete;
    DialPad& operator=(const DialPad&) = delete;

    // Window messages: WM_COMMAND (keys, 2002), WM_HSCROLL, WM_TIMER, 2026 (wParam = the card
    // state), 2125, 2126, 2127, the power button's down and up.
    long OnMessage(unsigned msg, long wParam, long lParam);
    // WM_DESTROY: keeps the volume, ends a call, stops the timer, waits for the dial thread.
    void Destroy();

    // The one way every part of the program places a call. 0 when a dial is still under way.
    int Dial(const std::u16string& number);
    // status line n = 1, 2, 3 or 5 (the number display); any other n does nothing.
    void SetStatusLine(int n, const std::u16string& text);

    // DialStart / DialCancel of the dial thread.
    int DialStart(const char* number);
    void DialCancel() { cancel_.store(1); }

    // Used by the alert handlers.
    int CallState() const { return callState_; }
    // Becomes the ringing state; a ring that starts a new call forgets the last caller and
    // keeps when the ring was read (readAt; a ring without a time counts as read now).
    void EnterRinging(const SystemTime& readAt);
    // A caller id read before the ringing call's ring: one of the call before, handed over late.
    bool ReadBeforeTheRing(const SystemTime& readAt) const;
    // A ring read at readAt belongs to a ringing call that has ended: read before End turned
    // the caller down or before an empty call list ended the ring (a repeat of the ring read
    // with that list and handed over after it), or handed over while a hang-up is still on its
    // way. Not a new caller: the card repeats a new caller's ring every few seconds.
    bool RingOfAnEndedCall(const SystemTime& readAt) const;
    // The number the ringing call's caller id showed, empty until one came.
    std::u16string& RingingCaller() { return ringingCaller_; }
    void RefreshNumberDisplay();

    Link& LinkRef() { return link_; }
    SettingsStore& Settings() { return settings_; }
    CallLog& Log() { return callLog_; }
    PhonebookCaches& Caches() { return caches_; }
    DialPadUi& Ui() { return ui_; }
    Notices& Notifications() { return notices_; }
    const DialNumber& Number() const { return number_; }
    int VolumeLevel() const { return volumeLevel_; }
    const std::u16string& OperatorName() const { return operatorName_; }
    bool NumberWasDialled() const { return numberDialled_; }
    // The clock of the double "0" and of the result's two seconds (tests drive it).
    void SetClock(SteadyNow now) { now_ = std::move(now); }

  private:
    void OnCommand(int id);
    void OnKey(char16_t c);
    void OnCallKey();
    // hangUp false: the call list shows the call over already.
    void OnEndKey(bool hangUp = true);
    void OnDialResult(int result);
    void OnCallActive();
    void CallAnswered();
    void OnCallListEmpty();
    void OnCallRinging();
    void OnTimer(int id);
    void OnPollRead(int bars, bool named);
    void OnVolumeSet(int result, int level);
    void OnAnswerResult(int result);
    void HangUpLater();
    void OnCardState(int state);
    void OnSlider(int code);
    void OnPowerKey(bool down);
    void PowerKeyHeld();
    // Status line 1 with a result, and the ended state with its start time.
    void EndWith(const std::u16string& text);
    void LeaveIdle();
    void SetAllKeys(bool enable);
    std::u16string CallerNumber();
    void JoinDialThread();

    Link& link_;
    SettingsStore& settings_;
    CallLog& callLog_;
    PhonebookCaches& caches_;
    DialPadUi& ui_;
    SteadyNow now_;

    int callState_ = kCallIdle;
    DialNumber number_;
    bool numberDialled_ = false;
    int volumeLevel_ = kDefaultVolumeLevel;
    int signalBars_ = 0;
    std::u16string operatorName_;
    std::chrono::steady_clock::time_point endedAt_{};
    int ticks_ = 0;
    // The idle status lines 1 and 2, put back once a result has shown for two seconds.
    std::u16string idleLines_[2];
    bool destroyed_ = false;

    std::atomic<int> cancel_{0};
    std::thread dialThread_;
    std::atomic<bool> dialThreadDone_{true};
    bool dialResultIn_ = false;  // the dial thread's result was handled (window's thread)

    Notices notices_;
    std::u16string ringingCaller_;

    // Every exchange the pad starts runs here, never on the window's thread.
    CardWorker worker_;
    bool connected_ = false;
    bool polling_ = false;    // a timed poll is under way
    bool answering_ = false;  // an ATA is under way
    // Hang-ups handed to the worker and not yet done: meanwhile the card may still list the
    // call, which is not a call to show again.
    std::atomic<int> hangUpsPending_{0};
    uint64_t ringReadAt_ = 0;     // when the ringing call's first ring was read (OrderOf)
    uint64_t ringEndedAt_ = 0;    // when a ring last ended, by End or the call list (OrderOf)
    bool initialVolume_ = false;  // the volume set at connection, whose refusal greys the slider
    std::mutex polledMutex_;
    std::u16string polledOperator_;
};

}  // namespace vqm
