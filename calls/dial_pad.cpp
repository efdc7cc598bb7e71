#include "calls/dial_pad.h"

#include <cstdio>
#include <cstring>
#include <mutex>

#include "calls/call_log.h"
#include "contacts/phonebook_cache.h"
#include "link/link.h"
#include "link/voice_at.h"
#include "settings/call_waiting_at.h"
#include "shell/messages.h"
#include "support/local_socket.h"
#include "support/numbers.h"
#include "support/settings_store.h"
#include "support/text.h"

namespace vqm {

namespace {

constexpr size_t kDialNumberBytes = 32;

std::u16string Wide(const char* narrow) {
    char16_t wide[64];
    NarrowToWideZ(narrow, std::strlen(narrow) + 1, wide, 64);
    return wide;
}

// The newest entry of the Dialed log by its date-time text; the later record wins a tie.
bool NewestDialled(CallLog& log, char (&number)[kCallLogNumberSize]) {
    const std::vector<CallLogRecord> records = ReadCallLog(log, kCallLogDialed);
    const CallLogRecord* newest = nullptr;
    for (const CallLogRecord& record : records) {
        if (!newest ||
            CompareDateTime(1, record.time, static_cast<int>(std::strlen(record.time)),
                            newest->time, static_cast<int>(std::strlen(newest->time))) <= 0)
            newest = &record;
    }
    if (!newest || newest->number[0] == '\0') return false;
    std::memcpy(number, newest->number, sizeof number);
    number[kCallLogNumberSize - 1] = '\0';
    return true;
}

}  // namespace

// The number buffer

int DialPadAppend(DialNumber& number, char16_t c, std::chrono::steady_clock::time_point now) {
    if (number.count > 21) return 0;
    if (c == u'0') {
        const bool quick = now - number.lastZero < std::chrono::milliseconds(kDoubleZeroMs);
        // A "+" means something only in front of a number: a quick "00" inside one stays "00".
        if (number.count == 2 && number.chars[1] == u'0' && quick) {
            number.chars[1] = u'+';
            return 1;
        }
        number.lastZero = now;
    }
    number.chars[number.count] = c;
    ++number.count;
    // The slot of a 20th character is written but never counted: at most 19 are shown.
    if (number.count == 21) {
        number.count = 20;
        return 0;
    }
    return 1;
}

int DialPadBackspace(DialNumber& number) {
    if (number.count <= 1) return 0;
    --number.count;
    return 1;
}

std::u16string DialPadText(const DialNumber& number) {
    if (number.count <= 1) return {};
    const int length = number.count > 21 ? 20 : number.count - 1;
    return std::u16string(number.chars + 1, static_cast<size_t>(length));
}

void DialPadEmpty(DialNumber& number) {
    number.count = 1;
}

// The DialPad

DialPad::DialPad(Link& link, SettingsStore& settings, CallLog& callLog, PhonebookCaches& caches,
                 DialPadUi& ui, SteadyNow now)
    : link_(link),
      settings_(settings),
      callLog_(callLog),
      caches_(caches),
      ui_(ui),
      now_(std::move(now)) {}

DialPad::~DialPad() {
    Destroy();
}

long DialPad::OnMessage(unsigned msg, long wParam, long lParam) {
    (void)lParam;
    if (destroyed_) return 0;
    switch (msg) {
        case kWmCommand:
            OnCommand(static_cast<int>(wParam & 0xFFFF));
            return 0;
        case kWmHScroll:
            OnSlider(static_cast<int>(wParam & 0xFFFF));
            return 0;
        case kWmTimer:
            OnTimer(static_cast<int>(wParam));
            return 0;
        case kMsgCardStateChanged:
            OnCardState(static_cast<int>(wParam));
            return 0;
        case kMsgDialResult:
            dialResultIn_ = true;
            OnDialResult(static_cast<int>(wParam));
            return 0;
        case kMsgCallActive:
            OnCallActive();
            return 0;
        case kMsgCallListEmpty:
            OnCallListEmpty();
            return 0;
        case kMsgCallRinging:
            OnCallRinging();
            return 0;
        case kMsgPollRead:
            OnPollRead(static_cast<int>(wParam), lParam != 0);
            return 0;
        case kMsgVolumeSet:
            OnVolumeSet(static_cast<int>(wParam), static_cast<int>(lParam));
            return 0;
        case kMsgAnswerResult:
            OnAnswerResult(static_cast<int>(wParam));
            return 0;
        case kWmLButtonDown:
        case kWmLButtonUp:
            if (wParam == kPowerKeyId) OnPowerKey(msg == kWmLButtonDown);
            return 0;
        default:
            return 0;
    }
}

void DialPad::Destroy() {
    if (destroyed_) return;
    if (ui_.ControlEnabled(kVolumeSliderId)) {
        const int32_t level = volumeLevel_;
        SetSettingInt(settings_, u"VolumeLevel", &level);
    }
    if (callState_ != kCallIdle) OnEndKey();
    ui_.StopTimer(kTimerDialPad);
    ui_.StopTimer(kTimerPowerKey);
    if (dialThread_.joinable()) {
        DialCancel();
        ui_.WaitWhileDelivering([this] { return dialThreadDone_.load(); });
    }
    // The hang-up queued above still goes out; the port is closed by now at shutdown, so
    // what is left ends at once.
    worker_.Stop();
    ui_.WaitWhileDelivering([this] { return worker_.Idle(); });
    worker_.Join();
    destroyed_ = true;
    JoinDialThread();
}

void DialPad::JoinDialThread() {
    // A dial whose result is in is only leaving its send: wait for it rather than refuse the
    // next dial (a Call pressed right after "Number is busy" would do nothing).
    if (dialThread_.joinable() && dialResultIn_)
        ui_.WaitWhileDelivering([this] { return dialThreadDone_.load(); });
    if (dialThread_.joinable() && dialThreadDone_.load()) dialThread_.join();
}

void DialPad::SetStatusLine(int n, const std::u16string& text) {
    switch (n) {
        case 1:
            ui_.SetControlText(kStatusLine1Id, text);
            break;
        case 2:
            ui_.SetControlText(kStatusLine2Id, text);
            break;
        case 3:
            ui_.SetControlText(kStatusLine3Id, text);
            break;
        case 5:
            ui_.SetControlText(kNumberDisplayId, text);
            break;
        default:
            break;
    }
}

void DialPad::RefreshNumberDisplay() {
    SetStatusLine(5, DialPadText(number_));
}

void DialPad::LeaveIdle() {
    if (callState_ != kCallIdle) return;
    idleLines_[0] = ui_.ControlText(kStatusLine1Id);
    idleLines_[1] = ui_.ControlText(kStatusLine2Id);
}

namespace {
// A moment as one number that orders like the moment.
uint64_t OrderOf(const SystemTime& t) {
    return ((((static_cast<uint64_t>(t.year) * 13 + t.month) * 32 + t.day) * 24 + t.hour) * 60 +
            t.minute) *
               60000 +
           t.second * 1000u + t.milliseconds;
}
}  // namespace

void DialPad::EnterRinging(const SystemTime& readAt) {
    if (callState_ != kCallRinging) {
        ringingCaller_.clear();
        ringReadAt_ =
            OrderOf(readAt.year != 0 ? readAt : ToSystemTimeUtc(std::chrono::system_clock::now()));
    }
    LeaveIdle();
    callState_ = kCallRinging;
}

void DialPad::EndWith(const std::u16string& text) {
    SetStatusLine(1, text);
    callState_ = kCallEnded;
    endedAt_ = now_();
}

std::u16string DialPad::CallerNumber() {
    return ui_.ControlText(kNumberDisplayId);
}

int DialPad::Dial(const std::u16string& number) {
    // One call at a time: a dial under way or a call in progress keeps the line.
    if (destroyed_ || (callState_ != kCallIdle && callState_ != kCallEnded)) return 0;
    JoinDialThread();
    if (dialThread_.joinable()) return 0;
    char narrow[kDialNumberBytes];
    WideToNarrow(number.data(), narrow, static_cast<int>(number.size()), sizeof narrow);
    char16_t name[64] = {};
    FindNameByNumber(caches_, narrow, name, 64);

    LeaveIdle();
    SetStatusLine(1, u"Dialing...");
    SetStatusLine(2, u"");
    SetStatusLine(3, name);
    SetStatusLine(5, number);
    callState_ = kCallDialing;
    if (!DialStart(narrow)) {
        EndWith(u"Call could not be established");
        return 0;
    }
    ui_.EnableControl(kKeyCallId, false);
    AddDialedCall(callLog_, narrow);
    return 1;
}

int DialPad::DialStart(const char* number) {
    JoinDialThread();
    if (dialThread_.joinable()) return 0;
    char request[kDialNumberBytes] = {};
    std::snprintf(request, sizeof request, "%s", number ? number : "");
    cancel_.store(0);
    dialThreadDone_.store(false);
    dialResultIn_ = false;
    dialThread_ = std::thread([this, request]() mutable {
        const int result = DialExchange(link_, request, cancel_);
        ui_.SendToDialPad(kMsgDialResult, result, 0);
        dialThreadDone_.store(true);
    });
    return 1;
}

void DialPad::OnCommand(int id) {
    if (id >= kKeyZeroId && id <= kKeyZeroId + 9) return OnKey(static_cast<char16_t>(id - 1078));
    switch (id) {
        case kKeyStarId:
            return OnKey(u'*');
        case kKeyHashId:
            return OnKey(u'#');
        case kKeyCallId:
            return OnCallKey();
        case kKeyEndId:
            return OnEndKey();
        case kKeyClearId: {
            if (callState_ != kCallIdle) return;
            // Clear edits the number on the display. After a dial or a ring that is not the
            // buffer, so the shown number becomes the one being typed.
            const std::u16string shown = ui_.ControlText(kNumberDisplayId);
            if (shown != DialPadText(number_)) {
                DialPadEmpty(number_);
                for (char16_t c : shown.substr(0, 19))
                    number_.chars[number_.count++] = c;
            }
            numberDialled_ = false;
            if (DialPadBackspace(number_)) RefreshNumberDisplay();
            return;
        }
        case kKeyContactsId:
            return ui_.SwitchToView(3);
        case kCmdNotificationTapped:
            return NotificationTapped(*this);
        default:
            return;
    }
}

void DialPad::OnKey(char16_t c) {
    if (numberDialled_) {
        DialPadEmpty(number_);
        numberDialled_ = false;
    }
    if (callState_ == kCallIdle) {
        DialPadAppend(number_, c, now_());
        RefreshNumberDisplay();
    } else if (callState_ == kCallVoice) {
        worker_.Post([this, c] { SendDtmf(link_, static_cast<char>(c)); });
    }
}

void DialPad::OnCallKey() {
    numberDialled_ = true;
    if (callState_ == kCallIdle) {
        if (number_.count <= 1) {
            char last[kCallLogNumberSize];
            if (NewestDialled(callLog_, last)) Dial(Wide(last));
        } else {
            Dial(DialPadText(number_));
        }
    } else if (callState_ == kCallRinging && !answering_) {
        answering_ = true;
        worker_.Post([this] { ui_.PostToDialPad(kMsgAnswerResult, AnswerCall(link_), 0); });
    }
}

void DialPad::OnAnswerResult(int result) {
    answering_ = false;
    if (callState_ != kCallRinging) return;  // ended meanwhile
    if (result == 0) {
        CallAnswered();
    } else {
        // The ring stops with the failed answer: a tone under "Call ended" would mislead.
        ui_.StopRingTone();
        EndWith(u"Call ended");
    }
}

void DialPad::HangUpLater() {
    ++hangUpsPending_;
    worker_.Post([this] {
        HangUp(link_);
        --hangUpsPending_;
    });
}

bool DialPad::ReadBeforeTheRing(const SystemTime& readAt) const {
    return readAt.year != 0 && OrderOf(readAt) < ringReadAt_;
}

bool DialPad::RingOfAnEndedCall(const SystemTime& readAt) const {
    if (hangUpsPending_.load() > 0) return true;
    // A ring the pad makes up itself (no time) is of the call the list shows now.
    return readAt.year != 0 && OrderOf(readAt) <= ringEndedAt_;
}

void DialPad::OnEndKey(bool hangUp) {
    DialPadEmpty(number_);
    switch (callState_) {
        case kCallDialing:
            DialCancel();
            break;
        case kCallVoice:
            if (hangUp) HangUpLater();
            EndWith(u"Call ended");
            break;
        case kCallRinging: {
            ringEndedAt_ = OrderOf(ToSystemTimeUtc(std::chrono::system_clock::now()));
            if (hangUp) HangUpLater();
            EndWith(u"Unanswered");
            ui_.StopRingTone();
            char narrow[kCallLogNumberSize];
            const std::u16string caller = CallerNumber();
            WideToNarrow(caller.data(), narrow, static_cast<int>(caller.size()), sizeof narrow);
            AddUnansweredCall(callLog_, narrow);
            break;
        }
        case kCallIdle:
            if (!numberDialled_) RefreshNumberDisplay();
            break;
        default:
            break;
    }
}

void DialPad::OnDialResult(int result) {
    switch (result) {
        case 0:
            SetStatusLine(1, u"Voice call");
            callState_ = kCallVoice;
            break;
        case 7:
            EndWith(u"Number is busy");
            break;
        case 8:
            EndWith(u"Number not answer");
            break;
        default:
            EndWith(u"Call could not be established");
            HangUpLater();
            break;
    }
    // A dial cut short by the card going leaves the key grey with the rest of the pad.
    ui_.EnableControl(kKeyCallId, connected_);
}

void DialPad::OnCallActive() {
    if (callState_ == kCallRinging) return CallAnswered();  // on the card's own controls
    if (callState_ == kCallIdle && connected_ && hangUpsPending_.load() == 0) {
        // A call the card already had (a restarted dialer, a card put back): shown, so that
        // End can end it.
        LeaveIdle();
        SetStatusLine(1, u"Voice call");
        callState_ = kCallVoice;
    }
}

// A ringing call answered, by the Call key or on the card: logged, the ring stops, talk starts.
void DialPad::CallAnswered() {
    char narrow[kCallLogNumberSize];
    const std::u16string caller = CallerNumber();
    WideToNarrow(caller.data(), narrow, static_cast<int>(caller.size()), sizeof narrow);
    AddAnsweredCall(callLog_, narrow);
    ui_.StopRingTone();
    SetStatusLine(1, u"Voice call");
    callState_ = kCallVoice;
}

void DialPad::OnCallListEmpty() {
    // The call is over and nothing is left to hang up: a hang-up now would turn away a caller
    // who rang since the list was read.
    if (callState_ == kCallRinging) NotifyUnansweredCall(*this);
    if (callState_ == kCallVoice || callState_ == kCallRinging) OnEndKey(/*hangUp=*/false);
}

// An answered call never rings again: the call talked on ended at the far end and a new
// caller rang before the call list came up empty in between. The end is shown, then the ring
// (whose own ring text came while the pad still talked, and was passed over then).
// That caller's own id came while the pad talked and was passed over too: the number is the
// one the call list shows, so that the old caller's number is neither shown nor logged for it.
void DialPad::OnCallRinging() {
    if (callState_ != kCallVoice) return;
    OnEndKey(/*hangUp=*/false);
    OnIncomingCall(*this, EventRecord{});
    if (callState_ != kCallRinging) return;
    const std::string number = RingingNumber(link_);
    ShowCaller(*this, number.c_str(), static_cast<int>(number.size()));
}

void DialPad::OnTimer(int id) {
    if (id == kTimerPowerKey) return PowerKeyHeld();
    if (id != kTimerDialPad) return;
    const bool gauge = ++ticks_ % kSignalRefreshTicks == 0;
    // The dial thread holds the port for the whole dial: a read now would only queue.
    const bool needOperator = operatorName_.empty() && callState_ != kCallDialing;
    if ((gauge || needOperator) && !polling_) {
        polling_ = true;
        worker_.Post([this, needOperator] {
            char16_t name[33] = {};
            const bool named = needOperator && GetOperatorName(link_, name, 33) && name[0];
            const int bars = GetSignalBars(link_);
            if (named) {
                std::lock_guard<std::mutex> lock(polledMutex_);
                polledOperator_ = name;
            }
            ui_.PostToDialPad(kMsgPollRead, bars, named ? 1 : 0);
        });
    }
    if (callState_ == kCallEnded && now_() - endedAt_ >= std::chrono::milliseconds(kResultShowMs)) {
        SetStatusLine(1, idleLines_[0]);
        SetStatusLine(2, idleLines_[1]);
        SetStatusLine(3, u"");
        callState_ = kCallIdle;
    }
}

void DialPad::OnPollRead(int bars, bool named) {
    polling_ = false;
    if (!connected_) return;  // the card went while the poll ran
    if (bars >= 0) {
        signalBars_ = bars;
        ui_.SetSignalBars(bars);
    }
    if (!named || !operatorName_.empty()) return;
    {
        std::lock_guard<std::mutex> lock(polledMutex_);
        operatorName_ = polledOperator_;
    }
    // Away from idle the name waits among the idle lines for the pad's return.
    if (callState_ == kCallIdle)
        SetStatusLine(1, operatorName_);
    else
        idleLines_[0] = operatorName_;
}

void DialPad::OnVolumeSet(int result, int level) {
    if (!connected_) return;
    if (result == 0) {
        volumeLevel_ = level;
    } else if (initialVolume_) {
        ui_.EnableControl(kVolumeSliderId, false);
    }
    initialVolume_ = false;
    // The card kept its level when it refused; so does the slider.
    ui_.SetSliderPosition(volumeLevel_);
}

void DialPad::SetAllKeys(bool enable) {
    for (int id = kKeyZeroId; id <= kKeyContactsId; ++id)
        ui_.EnableControl(id, enable);
}

void DialPad::OnCardState(int state) {
    if (state == 1) {
        connected_ = false;
        ui_.StopTimer(kTimerDialPad);
        SetAllKeys(false);
        ui_.EnableControl(kVolumeSliderId, false);
        SetStatusLine(1, u"");
        ui_.SetSliderPosition(0);
        signalBars_ = 0;
        ui_.SetSignalBars(0);
        ui_.SetControlText(kNotificationLineId, u"");
        ui_.ShowNotificationIcon(false);
        notices_.up = false;
        notices_.text.clear();
        // With the card gone no call can go on: the ring stops and the pad is idle again.
        if (callState_ == kCallRinging) ui_.StopRingTone();
        if (callState_ != kCallDialing) callState_ = kCallIdle;
        return;
    }
    if (state != 2) return;
    connected_ = true;
    SetAllKeys(true);
    ui_.EnableControl(kVolumeSliderId, true);
    SetStatusLine(1, u"Searching network...");
    operatorName_.clear();
    SetStatusLine(2, u"");
    SetStatusLine(3, u"");
    idleLines_[0] = u"Searching network...";
    idleLines_[1].clear();
    int32_t level = kDefaultVolumeLevel;
    if (!GetSettingInt(settings_, u"VolumeLevel", &level)) {
        level = kDefaultVolumeLevel;
        SetSettingInt(settings_, u"VolumeLevel", &level);
    }
    if (level < 0) level = 0;
    if (level > kMaxVolumeLevel) level = kMaxVolumeLevel;
    initialVolume_ = true;
    ui_.SetSliderPosition(level);
    worker_.Post(
        [this, level] { ui_.PostToDialPad(kMsgVolumeSet, SetSpeakerVolume(link_, level), level); });
    // A standard modem keeps a waiting caller to itself until asked to present it.
    worker_.Post([this] { PresentCallWaiting(link_); });
    const int32_t poweredUp = 0;
    SetSettingInt(settings_, u"DialPadPowerDown", &poweredUp);
    ticks_ = 0;
    ui_.StartTimer(kTimerDialPad, 1000);
}

void DialPad::OnSlider(int code) {
    if (!(code < 4 || code == kTbEndTrack)) return;
    const int position = ui_.SliderPosition();
    worker_.Post([this, position] {
        ui_.PostToDialPad(kMsgVolumeSet, SetSpeakerVolume(link_, position), position);
    });
}

void DialPad::OnPowerKey(bool down) {
    if (down)
        ui_.StartTimer(kTimerPowerKey, 1000);
    else
        ui_.StopTimer(kTimerPowerKey);
}

void DialPad::PowerKeyHeld() {
    // One power change per press, however long the button stays down.
    ui_.StopTimer(kTimerPowerKey);
    if (!ui_.CompanionExists()) return;
    const int32_t poweredDown = 1;
    SetSettingInt(settings_, u"DialPadPowerDown", &poweredDown);
    const std::optional<long> power = ui_.SendCompanion(kMsgCardPowerQuery);
    ui_.SendCompanion(power && *power != 0 ? kMsgCardPowerDown : kMsgCardPowerUp);
}

}  // namespace vqm
