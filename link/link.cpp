#include "link/link.h"

#include <fcntl.h>
#include <poll.h>
#include <sys/file.h>
#include <sys/ioctl.h>
#include <termios.h>
#include <unistd.h>

#include <cerrno>
#include <chrono>
#include <cstdio>
#include <cstdlib>
#include <cstring>

#include "link/operators.h"
#include "support/lock_within.h"
#include "support/text.h"

namespace vqm {

namespace {

constexpr int kMutexWaitMs = 5000;
constexpr int kReadTimeoutMs = 200;  // a one-byte read waits at most this long
constexpr int kAnswerPollMs = 100;   // the wait between looks for the first reply byte
constexpr int kLockRetryMs = 200;

const char kInitCommands[7][32] = {
    "AT&F\r",
    "ATE1\r",
    "ATX5\r",
    "AT+CSCS=\"8859-1\"\r",
    "AT+CBST=51,0,1\r",
    "AT+CLIP=1;+CRC=1\r",
    "AT+CNMI=1,1,0,0,0\r",
};

struct FinalResult {
    char text[64];
    int length;
    int code;
};
// "CARRIER\r" stands inside "NO CARRIER\r", so the order decides.
const FinalResult kFinalResults[8] = {
    {"BLACKLISTED\r", 12, 14}, {"BUSY\r", 5, 7},  {"NO CARRIER\r", 11, 3}, {"CARRIER\r", 8, 16},
    {"DELAYED\r", 8, 13},      {"ERROR\r", 6, 4}, {"NO ANSWER\r", 10, 8},  {"OK\r", 3, 0},
};

void Sleep(Link& link, int ms) {
    if (link.sleepMs)
        link.sleepMs(ms);
    else
        std::this_thread::sleep_for(std::chrono::milliseconds(ms));
}

enum class ReadResult { Byte, Silent, Failed };

// One byte, waiting at most timeoutMs. A vanished device (hang-up, I/O error) is a failure.
ReadResult ReadByte(int fd, char* out, int timeoutMs) {
    pollfd p{fd, POLLIN, 0};
    for (;;) {
        int ready = poll(&p, 1, timeoutMs);
        if (ready < 0 && errno == EINTR) continue;
        if (ready < 0) return ReadResult::Failed;
        if (ready == 0) return ReadResult::Silent;
        if (!(p.revents & POLLIN)) return ReadResult::Failed;
        ssize_t n = read(fd, out, 1);
        if (n == 1) return ReadResult::Byte;
        if (n < 0 && (errno == EINTR || errno == EAGAIN)) return ReadResult::Silent;
        return ReadResult::Failed;
    }
}

bool WriteByte(int fd, char byte) {
    for (;;) {
        ssize_t n = write(fd, &byte, 1);
        if (n == 1) return true;
        if (n < 0 && errno == EINTR) continue;
        if (n < 0 && errno == EAGAIN) {
            pollfd p{fd, POLLOUT, 0};
            if (poll(&p, 1, kReadTimeoutMs) > 0) continue;
        }
        return false;
    }
}

// After the port is free: queue what the text holds and hand the oldest record to its
// handler on this thread; later records wait for the listener.
void HandleUnsolicited(Link& link, const char* text, unsigned length) {
    if (link.events && length > 0 && link.events->UnsolicitedScan(text, static_cast<int>(length)))
        link.events->DispatchOldest();
}

using LockFunction = int (*)(Link&);

unsigned Transact(Link& link, LockFunction lock, const char* command, char* reply,
                  size_t replySize) {
    if (!reply || replySize == 0) return 0;
    reply[0] = '\0';
    if (link.portState.load() == 0 || !command) return 0;
    char pending[256];
    AtReadPending(link, pending, sizeof pending - 1);
    reply[0] = '\0';
    if (!lock(link)) return 0;

    unsigned length = 0;
    bool failed = false;
    {
        std::shared_lock<std::shared_mutex> io(link.ioGuard);
        const int fd = link.fd;
        if (fd < 0 || link.portState.load() == 0) {
            failed = true;
        } else {
            for (const char* p = command; *p; ++p) {
                char echo;
                if (!WriteByte(fd, *p) || ReadByte(fd, &echo, kReadTimeoutMs) == ReadResult::Failed)
                    break;
            }
            // No overall limit: a network operation may take many seconds. Closing the port
            // is what ends a wait for a card that never answers.
            for (;;) {
                Sleep(link, kAnswerPollMs);
                if (link.portState.load() == 0) {
                    failed = true;
                    break;
                }
                ReadResult r = ReadByte(fd, &reply[0], kReadTimeoutMs);
                if (r == ReadResult::Byte) break;
                if (r == ReadResult::Failed) {
                    failed = true;
                    break;
                }
            }
            if (!failed) {
                length = replySize > 1 ? 1 : 0;
                char byte;
                while (ReadByte(fd, &byte, kReadTimeoutMs) == ReadResult::Byte) {
                    if (length + 1 < replySize) reply[length++] = byte;
                }
                reply[length] = '\0';
            }
        }
    }
    PortUnlock(link);
    if (failed) {
        reply[0] = '\0';
        return 0;
    }
    HandleUnsolicited(link, reply, length);
    return length;
}

// Fills text with the reply's first line of information, converted to UTF-16.
void FirstLineToWide(char* reply, int length, char16_t* text, size_t textSize) {
    TrimReply(reply, &length);
    int lineLength = 0;
    while (lineLength < length && reply[lineLength] != '\r' && reply[lineLength] != '\n')
        ++lineLength;
    if (lineLength > 0)
        NarrowToWide(reply, text, lineLength, textSize);
    else if (text && textSize > 0)
        text[0] = u'\0';
}

void ListenerThread(Link* link) {
    bool callSeen = false;
    while (link->portState.load() > 0) {
        if (link->portState.load() != 2) {
            if (link->events) link->events->DispatchQueued();
            int state = -1, mode = -1;
            if (QueryCallState(*link, &state, &mode)) {
                if (state == 0 && mode == 0) {
                    if (link->postToMain) link->postToMain(kMsgCallActive);
                    callSeen = true;
                } else if (state == 4 && mode == 0 && !callSeen) {
                    // A call is ringing but no ring text arrived: act as if it had.
                    static const char kRing[] = "\r\n+CRING: VOICE\r\n\r\nOK\r\n";
                    if (link->events) {
                        link->events->UnsolicitedScan(kRing, sizeof kRing - 1);
                        link->events->DispatchQueued();
                    }
                    callSeen = true;
                }
            } else if (callSeen) {
                if (link->postToMain) link->postToMain(kMsgCallListEmpty);
                callSeen = false;
            }
        }
        // Sleep in small steps so that closing the port ends the thread promptly.
        for (int waited = 0; waited < 1000 && link->portState.load() > 0; waited += 100)
            Sleep(*link, 100);
    }
}

}  // namespace

Link::~Link() {
    PortClose(*this);
}

int PortOpen(Link& link) {
    char device[256];
    if (!FindCardPort(link.settings, link.roots, device, sizeof device)) return 0;
    return PortOpenDevice(link, device);
}

int PortOpenDevice(Link& link, const char* device) {
    if (link.fd >= 0 || !device) return 0;
    int fd = open(device, O_RDWR | O_NOCTTY | O_CLOEXEC | O_NONBLOCK);
    if (fd < 0) return 0;
    // No other program may use the port meanwhile: the kernel's exclusive mode (ignored for
    // root) and an advisory lock that cooperating programs honour.
    if (flock(fd, LOCK_EX | LOCK_NB) != 0) {
        close(fd);
        return 0;
    }
    ioctl(fd, TIOCEXCL);
    termios tio{};
    if (tcgetattr(fd, &tio) != 0) {
        close(fd);
        return 0;
    }
    // Change only what the card needs; flow control and the rest stay as the driver has them.
    cfsetispeed(&tio, B19200);
    cfsetospeed(&tio, B19200);
    tio.c_cflag = (tio.c_cflag & ~(CSIZE | PARENB | CSTOPB)) | CS8 | CREAD | CLOCAL;
    tio.c_iflag &= ~(INPCK | ISTRIP | IGNCR | ICRNL | INLCR | IXON | IXOFF);
    tio.c_lflag &= ~(ICANON | ECHO | ECHOE | ECHONL | ISIG | IEXTEN);
    tio.c_oflag &= ~OPOST;
    tio.c_cc[VMIN] = 0;
    tio.c_cc[VTIME] = 0;
    if (tcsetattr(fd, TCSANOW, &tio) != 0) {
        close(fd);
        return 0;
    }
    // A pseudo-terminal has no DTR line; failing to drop it there is not a failed open.
    int dtr = TIOCM_DTR;
    ioctl(fd, TIOCMBIC, &dtr);

    link.fd = fd;
    link.portState.store(1);
    if (!ModemInit(link)) {
        PortClose(link);
        return 0;
    }
    link.firmwareVersion = GetFirmwareVersion(link, nullptr, 0);
    link.listener = std::thread(ListenerThread, &link);
    return 1;
}

void PortClose(Link& link) {
    {
        std::lock_guard<std::mutex> lock(link.portMutex);
        link.portState.store(0);
    }
    if (link.listener.joinable() && link.listener.get_id() != std::this_thread::get_id())
        link.listener.join();
    std::unique_lock<std::shared_mutex> io(link.ioGuard);
    if (link.fd >= 0) {
        close(link.fd);
        link.fd = -1;
    }
}

int PortTryLock(Link& link) {
    if (!LockWithin(link.portMutex, kMutexWaitMs)) return 0;
    std::lock_guard<std::mutex> lock(link.portMutex, std::adopt_lock);
    if (link.portState.load() != 1) return 0;
    link.portState.store(2);
    return 1;
}

int PortLock(Link& link) {
    for (;;) {
        {
            std::lock_guard<std::mutex> lock(link.portMutex);
            int state = link.portState.load();
            if (state == 1) {
                link.portState.store(2);
                return 1;
            }
            if (state == 0) return 0;
        }
        Sleep(link, kLockRetryMs);
    }
}

void PortUnlock(Link& link) {
    if (!LockWithin(link.portMutex, kMutexWaitMs)) return;
    std::lock_guard<std::mutex> lock(link.portMutex, std::adopt_lock);
    // A port closed meanwhile stays closed.
    if (link.portState.load() == 2) link.portState.store(1);
}

unsigned AtCommand(Link& link, const char* command, char* reply, size_t replySize) {
    return Transact(link, PortLock, command, reply, replySize);
}

unsigned AtCommandTry(Link& link, const char* command, char* reply, size_t replySize) {
    return Transact(link, PortTryLock, command, reply, replySize);
}

unsigned AtReadPending(Link& link, char* buffer, size_t limit) {
    if (!buffer) return 0;
    buffer[0] = '\0';
    if (link.portState.load() == 0 || !PortTryLock(link)) return 0;
    unsigned count = 0;
    {
        std::shared_lock<std::shared_mutex> io(link.ioGuard);
        // Only what is already there: this drain must not add a wait to every command.
        char byte;
        while (link.fd >= 0 && count < limit && ReadByte(link.fd, &byte, 0) == ReadResult::Byte)
            buffer[count++] = byte;
        buffer[count] = '\0';
    }
    PortUnlock(link);
    HandleUnsolicited(link, buffer, count);
    return count;
}

int AtFinalResult(const char* reply, int length) {
    for (const FinalResult& row : kFinalResults)
        if (FindPattern(0, row.text, row.length, reply, length) >= 0) return row.code;
    return -1;
}

int ModemInit(Link& link) {
    for (const char* command : kInitCommands) {
        char reply[256];
        if (AtCommand(link, command, reply, sizeof reply) == 0) return 0;
    }
    return 1;
}

float GetFirmwareVersion(Link& link, char16_t* text, size_t textSize) {
    char reply[256];
    int length = static_cast<int>(AtCommand(link, "AT+GMR\r", reply, sizeof reply));
    if (length == 0) return 0.0f;
    float version = 0.0f;
    int at = FindPattern(0, "SW", 2, reply, length);
    if (at >= 0 && std::sscanf(reply + at, "SW%f", &version) != 1) version = 0.0f;
    if (text) FirstLineToWide(reply, length, text, textSize);
    return version;
}

int GetCardIdentity(Link& link, char16_t* manufacturer, size_t manufacturerSize, char16_t* model,
                    size_t modelSize, char16_t* firmware, size_t firmwareSize) {
    char reply[256];
    int length = static_cast<int>(AtCommand(link, "AT+GMI\r", reply, sizeof reply));
    if (length == 0) return 0;
    FirstLineToWide(reply, length, manufacturer, manufacturerSize);
    length = static_cast<int>(AtCommand(link, "AT+GMM\r", reply, sizeof reply));
    if (length == 0) return 0;
    FirstLineToWide(reply, length, model, modelSize);
    GetFirmwareVersion(link, firmware, firmwareSize);
    return 1;
}

int GetSignalBars(Link& link) {
    char reply[256];
    int length = static_cast<int>(AtCommandTry(link, "AT+CSQ\r", reply, sizeof reply));
    if (length == 0) return -1;
    int quality = 0, errorRate = 0;
    int at = FindPattern(0, "+CSQ: ", 6, reply, length);
    if (at >= 0 && std::sscanf(reply + at + 6, "%d,%d", &quality, &errorRate) < 1) quality = 0;
    // 99 means "not known"; it shows as full strength, as the card's own display did.
    if (quality < 8) return 0;
    if (quality < 16) return 1;
    if (quality < 24) return 2;
    if (quality < 31) return 3;
    return 4;
}

int GetOperatorName(Link& link, char16_t* name, size_t nameSize) {
    char reply[256];
    int length = static_cast<int>(AtCommand(link, "AT+COPS?\r", reply, sizeof reply));
    if (length == 0) return 0;
    int at = FindPattern(0, ",2,", 3, reply, length);
    uint32_t code = at >= 1 ? static_cast<uint32_t>(std::atoi(reply + at + 3)) : 0;
    char narrow[32];
    int nameLength = OperatorNameByCode(code, narrow, sizeof narrow);
    if (nameLength <= 0) return 0;
    NarrowToWide(narrow, name, nameLength, nameSize);
    return 1;
}

int GetSpeakerVolume(Link& link) {
    char reply[256];
    int length = static_cast<int>(AtCommandTry(link, "AT+CLVL?\r", reply, sizeof reply));
    if (length == 0) return -1;
    int at = FindPattern(0, "+CLVL:", 6, reply, length);
    if (at < 0) return -1;
    const char* p = reply + at + 6;
    while (*p == ' ')
        ++p;
    int32_t level = -1;
    return ParseInt(p, reply + length, &level) ? level : -1;
}

int SetSpeakerVolume(Link& link, int level) {
    char command[32], reply[256];
    std::snprintf(command, sizeof command, "AT+CLVL=%d\r", level);
    int length = static_cast<int>(AtCommand(link, command, reply, sizeof reply));
    return length == 0 ? -1 : AtFinalResult(reply, length);
}

int QueryCallState(Link& link, int* state, int* mode) {
    char reply[256];
    int length = static_cast<int>(AtCommand(link, "AT+CLCC\r", reply, sizeof reply));
    if (length == 0) return 0;
    int at = FindPattern(0, "+CLCC:", 6, reply, length);
    if (at < 0) return 0;
    const char* end = reply + length;
    const char* p = reply + at + 6;
    while (p < end && *p == ' ')
        ++p;
    int32_t fields[4];
    for (int i = 0; i < 4; ++i) {
        p = ParseInt(p, end, &fields[i]);
        if (!p) return 0;
        if (i < 3) {
            if (*p != ',') return 0;
            ++p;
        }
    }
    if (state) *state = fields[2];
    if (mode) *mode = fields[3];
    return 1;
}

}  // namespace vqm
