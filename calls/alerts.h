// What the DialPad does with a ring and a caller's number from the card, and the notification
// line it keeps for unanswered calls, new messages and a full SIM, with the desktop
// notification that goes with it.
#pragma once

#include <cstddef>
#include <functional>
#include <string>

#include "calls/event_log.h"

namespace vqm {

class DialPad;
class UnsolicitedEvents;

inline constexpr int kNotificationIconId = 106;

// The kinds of notice the line shows.
inline constexpr int kNoticeNone = 0, kNoticeNewMessages = 1, kNoticeUnansweredCalls = 2,
                     kNoticeSimFull = 3;

struct Notices {
    int unansweredCalls = 0;
    bool up = false;
    int lastKind = kNoticeNone;
    std::u16string text;
};

// "+CRING:": the DialPad comes forward with "Incoming call", the call state becomes 4 and the
// ring tone starts. Returns 0.
int OnIncomingCall(DialPad& pad, const EventRecord& record);
// "+CLIP:": the caller's number (and its name from the phonebook caches) on status lines 2 and 3
// and in the number display. Returns 0.
int OnCallerId(DialPad& pad, const EventRecord& record);
// Shows the ringing call's caller as "+CLIP:" does: number (length bytes, 0 for "No number")
// and name. A different number while the pad still rings for an earlier caller logs that
// caller as unanswered.
void ShowCaller(DialPad& pad, const char* number, int length);

// "+CCWA:": a second caller waits behind the call in progress. The number (and its name) goes on
// status line 3 as "Waiting: ..."; the call, its state, the display and the ring tone stay as
// they are. Outside a voice call the line means nothing and is ignored. Returns 0.
int OnCallWaiting(DialPad& pad, const EventRecord& record);

// "+CMTI:": the location joins the new messages (the full-SIM alert first when simFull, the
// card's SmsStorageFull answer, is 1) and the DialPad announces the unread count. The card is
// asked by the dispatching thread: the DialPad's thread, the window's, never waits on it.
// Returns 0.
int OnNewMessage(DialPad& pad, const EventRecord& record, int simFull);
// The location of a "+CMTI:" record: the integer after the quoted memory name and ",", -1 when
// there is none; the memory name goes to memory when given.
int NewMessageLocation(const EventRecord& record, char* memory = nullptr, size_t memorySize = 0);

// The caller's number of a "+CLIP:" record: unquoted up to firmware 3.81 (blanks skipped, then
// digits and "+"), the quoted field after; a quoted first field is read quoted whatever the
// firmware, and a type of 145 gives the '+' the number lacks. Writes at most numberSize - 1
// bytes and a NUL; returns the length, 0 when there is none.
int CallerIdNumber(const EventRecord& record, float firmwareVersion, char* number,
                   size_t numberSize);

// The notification line. show 0 clears the new-message notice.
void NotifyNewMessages(DialPad& pad, int show, int unreadCount);
void NotifyUnansweredCall(DialPad& pad);
void NotifySimFull(DialPad& pad, int full);
// A tap on the notice (or its desktop notification's action, 2002): the notice goes and the list
// it speaks of opens: the Call Log for unanswered calls, the SMS Folder otherwise.
void NotificationTapped(DialPad& pad);

// Installs OnIncomingCall, OnCallerId, OnNewMessage and OnCallWaiting into the events' table.
// Handlers may be dispatched on the listener or the dial thread; onPadThread runs the work on the
// DialPad's own thread and waits for it.
void InstallCallHandlers(UnsolicitedEvents& events, DialPad& pad,
                         std::function<void(const std::function<void()>&)> onPadThread);

}  // namespace vqm
