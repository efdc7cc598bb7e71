// The serial link to the card: opening and configuring its port, the port lock that
// serialises every exchange, the AT transaction, the card queries and the listener thread.
#pragma once

#include <atomic>
#include <cstddef>
#include <cstdint>
#include <functional>
#include <mutex>
#include <shared_mutex>
#include <thread>

#include "link/event_sink.h"
#include "link/ports.h"

namespace vqm {

class SettingsStore;

inline constexpr int kMsgCallActive = 2126;
inline constexpr int kMsgCallListEmpty = 2127;

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

    int fd = -1;
    // Held only for the instant of testing and changing portState; a transaction owns the port
    // while portState is 2, so a waiting party can give up without blocking for a whole exchange.
    std::mutex portMutex;
    std::atomic<int> portState{0};  // 0 closed, 1 open and free, 2 in use
    float firmwareVersion = 0.0f;

    // Readers hold it shared while they touch fd; closing takes it exclusively so that the
    // descriptor is never closed under a read.
    std::shared_mutex ioGuard;
    std::thread listener;
};

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

// One exchange with the card. Returns the number of bytes read into reply (NUL-terminated,
// at most replySize - 1; what the card sends beyond that is read and dropped), 0 on failure.
unsigned AtCommand(Link& link, const char* command, char* reply, size_t replySize);
// The same, but gives up at once (0) when the port stays busy for 5 s.
unsigned AtCommandTry(Link& link, const char* command, char* reply, size_t replySize);
// Bytes already waiting on the port, at most limit (buffer holds limit + 1).
unsigned AtReadPending(Link& link, char* buffer, size_t limit);

// Final-result code of a reply: 0 OK, 3 NO CARRIER, 4 ERROR, 7 BUSY, 8 NO ANSWER,
// 13 DELAYED, 14 BLACKLISTED, 16 CARRIER, -1 none.
int AtFinalResult(const char* reply, int length);

int ModemInit(Link& link);
float GetFirmwareVersion(Link& link, char16_t* text, size_t textSize);
int GetCardIdentity(Link& link, char16_t* manufacturer, size_t manufacturerSize, char16_t* model,
                    size_t modelSize, char16_t* firmware, size_t firmwareSize);
int GetSignalBars(Link& link);
int GetOperatorName(Link& link, char16_t* name, size_t nameSize);
int GetSpeakerVolume(Link& link);
int SetSpeakerVolume(Link& link, int level);

// "AT+CLCC": 1 with the state and mode of the first listed call; 0 when there is no call,
// no reply or a malformed line.
int QueryCallState(Link& link, int* state, int* mode);

}  // namespace vqm
