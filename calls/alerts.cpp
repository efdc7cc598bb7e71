#include "calls/alerts.h"

#include <cstdio>
#include <memory>

#include "calls/call_log.h"
#include "calls/dial_pad.h"
#include "calls/tones.h"
#include "calls/unsolicited.h"
#include "contacts/phonebook_cache.h"
#include "link/device_at.h"
#include "link/link.h"
#include "messaging/message_store.h"
#include "messaging/sms_at.h"
#include "settings/call_waiting_at.h"
#include "support/local_socket.h"
#include "support/settings_store.h"
#include "support/text.h"

namespace vqm {

namespace {

constexpr int kViewSmsFolder = 2, kViewCallLog = 5;
constexpr char16_t kSimFull[] = u"SIM Full";
constexpr char16_t kJoinedSimFull[] = u"/SIM Full";

std::u16string Counted(int count, const char* format) {
    char text[64];
    std::snprintf(text, sizeof text, format, count);
    return Utf8ToUtf16(text);
}

// The shell notification, unless another program asked (once) for this alert to stay quiet:
// "CeNFMessageAlert" = 1 suppresses exactly one, and reads 0 afterwards.
void PostShellNotification(DialPad& pad, const std::u16string& text, bool youHave) {
    SettingsStore& settings = pad.Settings();
    int32_t quiet = 0;
    if (GetSettingInt(settings, u"CeNFMessageAlert", &quiet)) {
        const int32_t zero = 0;
        SetSettingInt(settings, u"CeNFMessageAlert", &zero);
        if (quiet == 1) return;
    }
    const std::u16string body = (youHave ? u"<html><body>You have " : u"<html><body>") + text +
                                u".<p><a href=\"cmd:2002\">Open DialPad</a></body></html>";
    pad.Ui().PostNotification(body, AlertTonePath(settings));
}

// Sets the notification line. A full SIM stays named while other notices come and go.
void Post(DialPad& pad, int kind, const std::u16string& text, bool youHave) {
    Notices& notices = pad.Notifications();
    std::u16string shown = text;
    if (kind != kNoticeSimFull && notices.up &&
        (notices.text.find(u'/') != std::u16string::npos || notices.lastKind == kNoticeSimFull))
        shown = text + kJoinedSimFull;
    pad.Ui().ShowNotificationIcon(true);
    pad.Ui().SetControlText(kNotificationLineId, shown);
    notices.up = true;
    notices.lastKind = kind;
    notices.text = shown;
    PostShellNotification(pad, text, youHave);
}

void ClearLine(DialPad& pad) {
    Notices& notices = pad.Notifications();
    notices.up = false;
    notices.text.clear();
    pad.Ui().ShowNotificationIcon(false);
    pad.Ui().SetControlText(kNotificationLineId, u"");
}

// A notice other than the full SIM goes; "SIM Full" stays when it was joined to it.
void ClearNotice(DialPad& pad) {
    Notices& notices = pad.Notifications();
    const size_t joined = notices.text.rfind(kJoinedSimFull);
    if (notices.up && joined != std::u16string::npos &&
        joined + std::char_traits<char16_t>::length(kJoinedSimFull) == notices.text.size()) {
        notices.text = kSimFull;
        notices.lastKind = kNoticeSimFull;
        pad.Ui().SetControlText(kNotificationLineId, notices.text);
        return;
    }
    ClearLine(pad);
}

}  // namespace

int CallerIdNumber(const EventRecord& record, float firmwareVersion, char* number,
                   size_t numberSize) {
    // The record's text field holds 256 bytes; its length is at most 255.
    return ParseCallerIdLine(record.text, record.length, firmwareVersion, number, numberSize);
}

int OnIncomingCall(DialPad& pad, const EventRecord& record) {
    // A call being dialled or talked on keeps the pad: this dialer does not take a second one.
    if (pad.CallState() == kCallDialing || pad.CallState() == kCallVoice) return 0;
    // A repeat of the ring turned down here, handed over late, must not ring again (and log
    // its caller a second time).
    if (pad.RingOfAnEndedCall(record.time)) return 0;
    DialPadUi& ui = pad.Ui();
    // The card repeats the ring every few seconds: a repeat leaves the caller's name and
    // number standing instead of blanking them until the next caller id.
    const bool repeat = pad.CallState() == kCallRinging;
    pad.EnterRinging(record.time);
    ui.BringDialPadForward();
    if (!repeat) ui.ShowStatus(u"Incoming call", u"");
    ui.DisplayOnIfOff();
    ui.StartRingTone();
    return 0;
}

int OnCallerId(DialPad& pad, const EventRecord& record) {
    if (record.length < 7 || pad.CallState() != kCallRinging) return 0;
    // The caller id of a call before this one (answered, or turned down), handed over late:
    // taken for this caller's it would log that caller again as unanswered.
    if (pad.ReadBeforeTheRing(record.time)) return 0;
    char number[64];
    const int length = CallerIdNumber(record, pad.LinkRef().firmwareVersion, number, sizeof number);
    ShowCaller(pad, number, length);
    return 0;
}

void ShowCaller(DialPad& pad, const char* number, int length) {
    std::u16string shown = u"No number";
    char16_t name[64] = {};
    if (length > 0) {
        char16_t wide[64];
        NarrowToWide(number, wide, length, 64);
        shown = wide;
        FindNameByNumber(pad.Caches(), number, name, 64);
    }
    // Another number while the pad still rings for the one before: that caller gave up before
    // the call list could tell, and a new call rings. The one before is logged, not lost.
    const std::u16string before = pad.RingingCaller();
    if (length > 0) pad.RingingCaller() = shown;
    if (length > 0 && !before.empty() && before != shown) {
        char previous[kCallLogNumberSize];
        WideToNarrow(before.data(), previous, static_cast<int>(before.size()), sizeof previous);
        AddUnansweredCall(pad.Log(), previous);
        NotifyUnansweredCall(pad);
    }
    pad.SetStatusLine(2, name);
    pad.SetStatusLine(3, shown);
    pad.SetStatusLine(5, shown);
}

int OnCallWaiting(DialPad& pad, const EventRecord& record) {
    if (pad.CallState() != kCallVoice) return 0;
    char number[64];
    const int length = ParseCallWaitingLine(record.text, record.length, number, sizeof number);
    std::u16string shown = u"No number";
    if (length > 0) {
        char16_t wide[64];
        NarrowToWide(number, wide, length, 64);
        shown = wide;
        char16_t name[64] = {};
        if (FindNameByNumber(pad.Caches(), number, name, 64) && name[0])
            shown = std::u16string(name) + u" " + shown;
    }
    pad.SetStatusLine(3, u"Waiting: " + shown);
    return 0;
}

int NewMessageLocation(const EventRecord& record, char* memory, size_t memorySize) {
    const int length = record.length;
    if (length < 7) return -1;
    const char* end = record.text + length;
    char name[16];
    int copied = 0;
    const char* p = ParseQuoted(record.text + 6, end, name, sizeof name, &copied);
    if (memory && memorySize > 0) std::snprintf(memory, memorySize, "%s", p ? name : "");
    int32_t location = -1;
    if (!p || p >= end || *p != ',' || !ParseInt(p + 1, end, &location)) return -1;
    return location;
}

int OnNewMessage(DialPad& pad, const EventRecord& record, int simFull) {
    if (record.length < 7) return 0;
    SettingsStore& settings = pad.Settings();
    SmsNoteNewMessage(settings, simFull, NewMessageLocation(record),
                      [&pad](int full) { NotifySimFull(pad, full); });
    NotifyNewMessages(pad, 1, UnreadMessageCount(settings));
    return 0;
}

void NotifyNewMessages(DialPad& pad, int show, int unreadCount) {
    if (!show) {
        if (pad.Notifications().lastKind == kNoticeNewMessages) ClearNotice(pad);
        return;
    }
    pad.Ui().ShowDialPad();
    pad.Ui().DisplayOnIfOff();
    Post(pad, kNoticeNewMessages, Counted(unreadCount, "%d new SMS"), true);
}

void NotifyUnansweredCall(DialPad& pad) {
    pad.Ui().ShowDialPad();
    const int count = ++pad.Notifications().unansweredCalls;
    Post(pad, kNoticeUnansweredCalls,
         Counted(count, count == 1 ? "%d unanswered call" : "%d unanswered calls"), true);
}

void NotifySimFull(DialPad& pad, int full) {
    if (full) {
        Post(pad, kNoticeSimFull, kSimFull, false);
        return;
    }
    ClearLine(pad);
    pad.Notifications().lastKind = kNoticeNone;
    if (pad.Ui().CompanionExists()) pad.Ui().SendCompanion(kMsgSimFullCleared);
}

void NotificationTapped(DialPad& pad) {
    Notices& notices = pad.Notifications();
    if (!notices.up) return;
    const int kind = notices.lastKind;
    ClearLine(pad);
    notices.lastKind = kNoticeNone;
    if (kind == kNoticeUnansweredCalls) {
        notices.unansweredCalls = 0;
        pad.Ui().SwitchToView(kViewCallLog);
    } else {
        pad.Ui().SwitchToView(kViewSmsFolder);
    }
}

namespace {

// What the card last said of its SIM store, carried through a burst of new messages.
struct SimFill {
    int32_t used = -1, total = -1;
};

// Whether the SIM is full with one more new message. The card is asked for the first message of
// a burst, and whenever the count comes to full (the alert is the card's word); each message
// queued behind it takes one place more without asking, so that a burst of new messages does
// not hold the listener, and a ring queued behind them, a third of a second each.
int SimFullWithNewMessage(Link& link, SimFill& fill, bool moreQueued) {
    int full = 0;
    if (fill.total > 0 && fill.used + 1 < fill.total) {
        ++fill.used;
    } else {
        int32_t used = 0, total = 0;
        if (SmsSelectSimStorage(link, &used, &total)) {
            fill = {used, total};
            full = used == total ? 1 : 0;
        } else {
            fill = {};
        }
    }
    if (!moreQueued) fill = {};  // the burst is over: the next message asks afresh
    return full;
}

}  // namespace

void InstallCallHandlers(UnsolicitedEvents& events, DialPad& pad,
                         std::function<void(const std::function<void()>&)> onPadThread) {
    events.SetHandler(kEventRing, [&pad, onPadThread](const EventRecord& record) {
        onPadThread([&] { OnIncomingCall(pad, record); });
        return 0;
    });
    events.SetHandler(kEventCallerId, [&pad, onPadThread](const EventRecord& record) {
        onPadThread([&] { OnCallerId(pad, record); });
        return 0;
    });
    // One dispatcher at a time hands records over, so the fill needs no lock.
    auto fill = std::make_shared<SimFill>();
    events.SetHandler(
        kEventNewMessage, [&pad, &events, fill, onPadThread](const EventRecord& record) {
            // The card is asked here, not on the pad's thread, the window's. The record being
            // handed over is still in the queue: more than one means more are waiting.
            const bool moreQueued = events.Log().EventLogCount() > 1;
            const int simFull =
                record.length < 7 ? 0 : SimFullWithNewMessage(pad.LinkRef(), *fill, moreQueued);
            onPadThread([&] { OnNewMessage(pad, record, simFull); });
            return 0;
        });
    events.SetHandler(kEventCallWaiting, [&pad, onPadThread](const EventRecord& record) {
        onPadThread([&] { OnCallWaiting(pad, record); });
        return 0;
    });
}

}  // namespace vqm
