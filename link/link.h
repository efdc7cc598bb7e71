// The serial link to the card: opening and configuring its port, the port lock that
// serialises every exchange, the AT transaction, the card queries and the listener thread.
#pragma once

#include <atomic>
#include <condition_variable>
#include <cstddef>
#include <cstdint>
#include <functional>
#include <mutex>
#include <shared_mutex>
#include <string>
#include <thread>

#include "link/event_sink.h"
#include "link/ports.h"

namespace vqm {

class SettingsStore;

inline constexpr int kMsgCallActive = 2126;
inline constexpr int kMsgCallListEmpty = 2127;
// The card has left kUnansweredGone exchanges in a row unanswered within their limits (about ten
// seconds of silence with the listener's polls alone): the main window treats it as gone, as it
// does a pulled card, and the card watch connects again once the card answers.
inline constexpr int kMsgCardSilent = 2133;
// The call list shows a single call ringing (sent on every pass that finds one): a DialPad that
// still talks on a call learns that the call ended and a new caller rang between two passes.
inline constexpr int kMsgCallRinging = 2134;
inline constexpr int kUnansweredGone = 3;

// Whether the modem echoes what it is sent, as the link has learnt it.
enum class EchoMode { Unknown, Echoes, Silent };

struct Link {
    Link(SettingsStore& store, DriverRoots driverRoots)
        : settings(store), roots(std::move(driverRoots)) {}
    ~Link();
    Link(const Link&) = delete;
    Link& operator=(const Link&) = delete;

    SettingsStore& settings;
    DriverRoots roots;
    EventSink* events = nullptr;                  // unsolicited codes go here; may be null
    std::function<void(int message)> postToMain;  // 2126/2127 for the main window
    std::function<void(int ms)> sleepMs;          // the waits; tests may shorten them
    int listenerPassMs = 1000;                    // the call-list poll's cadence

    int fd = -1;
    // Held only for the instant of testing and changing portState; a transaction owns the port
    // while portState is 2, so a waiting party can give up without blocking for a whole exchange.
    std::mutex portMutex;
    std::condition_variable portChanged;  // portState or the turn changed
    // Waiting parties take the port in the order they asked for it (a ticket each), so the
    // listener's call-list poll is never starved by a stream of other commands.
    unsigned long nextTicket = 0, servingTicket = 0, openCount = 0;
    std::atomic<int> portState{0};  // 0 closed, 1 open and free, 2 in use
    float firmwareVersion = 0.0f;
    std::atomic<EchoMode> echo{EchoMode::Unknown};
    // Exchanges in a row that got no answer at all within their limit.
    std::atomic<int> unansweredInRow{0};
    // The start of an unsolicited line that a read ended in the middle of. Guarded by its own
    // mutex: an exchange of an earlier opening may still be leaving when the port reopens.
    std::mutex partialMutex;
    std::string partialLine;
    // The number of the ringing call the listener's last poll found (kMsgCallRinging): a pad
    // that missed that caller's id while it still talked shows it from here.
    std::mutex ringingMutex;
    std::string ringingNumber;
    // Written to wake the listener: an unsolicited record was queued, or the port closes.
    int wakeFd = -1;

    // Readers hold it shared while they touch fd; closing takes it exclusively so that the
    // descriptor is never closed under a read.
    std::shared_mutex ioGuard;
    std::thread listener;
};

// The number kept with the last kMsgCallRinging; empty when the call list showed none.
std::string RingingNumber(Link& link);

// Opens the card's port at 19200 8N1 with DTR off, initialises the card, reads its firmware
// and starts the listener. 1 on success; 0 with everything closed again.
int PortOpen(Link& link);
// Opens a given device the same way (for tools and tests that know the device).
int PortOpenDevice(Link& link, const char* device);
// Closes the port and ends the listener, waiting for it; safe while a transaction runs.
void PortClose(Link& link);

int PortTryLock(Link& link);
// Waits until the caller owns the port: 1, or 0 once the port is closed (so that shutdown
// never leaves a caller waiting for a port that will not come back).
int PortLock(Link& link);
void PortUnlock(Link& link);

// How one exchange takes the port and how long it waits for the card's answer.
struct ExchangeOptions {
    bool tryLock = false;  // give up (0) when the port is busy instead of waiting for it
    // The longest wait for the first byte of the reply; 0 waits until the port closes, for a
    // network operation that may take many seconds.
    int answerLimitMs = 0;
    // Set to 1 by another thread to end the wait for the reply (taken and cleared here).
    std::atomic<int>* cancel = nullptr;
    // The caller already owns the port (PortLock) and keeps it afterwards: for exchanges that
    // must follow each other with nothing between, such as a message's text after its prompt.
    bool lockHeld = false;
    // A cancelled wait takes the command back (a byte sent, its result read): for a dial.
    bool abortOnCancel = false;
};

// The answer wait of the exchanges that any modem answers at once (queries, start-up, hang-up).
inline constexpr int kQueryAnswerLimitMs = 3000;

// One exchange with the card. Returns the number of bytes read into reply (NUL-terminated,
// at most replySize - 1; what the card sends beyond that is read and dropped), 0 on failure.
// The reply holds the command's own lines only: the echo and unsolicited lines are taken out
// (the latter go to the event sink). It ends when the card falls silent after its final result.
unsigned AtExchange(Link& link, const char* command, char* reply, size_t replySize,
                    const ExchangeOptions& options);
// Waits for the port and for the reply as long as it takes.
unsigned AtCommand(Link& link, const char* command, char* reply, size_t replySize);
// The same, but gives up at once (0) when the port stays busy for 5 s.
unsigned AtCommandTry(Link& link, const char* command, char* reply, size_t replySize);
// Waits for the port, but for the reply's first byte at most limitMs.
unsigned AtCommandWithin(Link& link, const char* command, char* reply, size_t replySize,
                         int limitMs);
// Bytes already waiting on the port, at most limit (buffer holds limit + 1).
unsigned AtReadPending(Link& link, char* buffer, size_t limit);

// Wakes the listener so that it dispatches what was queued at once.
void WakeListener(Link& link);

// Final-result code of a reply: 0 OK, 3 NO CARRIER, 4 ERROR, 7 BUSY, 8 NO ANSWER,
// 13 DELAYED, 14 BLACKLISTED, 16 CARRIER, -1 none.
int AtFinalResult(const char* reply, int length);

int ModemInit(Link& link);

}  // namespace vqm

// The card queries (firmware, identity, signal, operator, volume, call list).
#include "link/device_at.h"  // IWYU pragma: export
