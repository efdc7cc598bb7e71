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
#include <string>
#include <vector>

#include <sys/eventfd.h>

#include "link/device_at.h"
#include "link/reply_framer.h"
#include "support/lock_within.h"
#include "support/text.h"

namespace vqm {

namespace {

constexpr int kMutexWaitMs = 5000;
constexpr int kReadTimeoutMs = 200;  // a one-byte read waits at most this long
constexpr int kAnswerPollMs = 100;   // the wait between looks for the first reply byte
constexpr int kInterByteMs = 20;     // the bytes of one line follow each other closer

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

// Hands each unsolicited line to the event sink and wakes the listener, which dispatches the
// queued records in order; the transaction itself dispatches nothing.
void QueueUnsolicited(Link& link, const std::vector<std::string>& lines) {
    bool queued = false;
    for (const std::string& line : lines)
        if (link.events && link.events->QueueLine(line.data(), static_cast<int>(line.size())))
            queued = true;
    if (queued) WakeListener(link);
}

// Reads what is waiting on the port into a framer, each byte with at most waitMs of silence.
// Returns false when the device failed.
bool ReadInto(int fd, ReplyFramer& framer, int waitMs, size_t limit, unsigned* count) {
    char byte;
    for (size_t n = 0; n < limit; ++n) {
        ReadResult r = ReadByte(fd, &byte, waitMs);
        if (r == ReadResult::Failed) return false;
        if (r == ReadResult::Silent) return true;
        framer.Feed(byte);
        if (count) ++*count;
    }
    return true;
}

bool WriteAll(int fd, const char* bytes, size_t count) {
    for (size_t i = 0; i < count; ++i)
        if (!WriteByte(fd, bytes[i])) return false;
    return true;
}

bool TakeCancel(const ExchangeOptions& options) {
    return options.cancel && options.cancel->exchange(0) == 1;
}

// Silence before the final result only means a slow modem; this long of it, once the reply
// has begun, means the final result is not coming.
constexpr int kMissingResultMs = 2000;
// How long a taken-back dial's result is waited for.
constexpr int kAbortResultMs = 1000;

}  // namespace

void WakeListener(Link& link) {
    if (link.wakeFd < 0) return;
    const uint64_t one = 1;
    (void)!write(link.wakeFd, &one, sizeof one);
}

namespace {

std::string TakePartialLine(Link& link) {
    std::lock_guard<std::mutex> lock(link.partialMutex);
    std::string line;
    line.swap(link.partialLine);
    return line;
}

void KeepPartialLine(Link& link, std::string line) {
    std::lock_guard<std::mutex> lock(link.partialMutex);
    link.partialLine = std::move(line);
}

}  // namespace

unsigned AtExchange(Link& link, const char* command, char* reply, size_t replySize,
                    const ExchangeOptions& options) {
    if (!reply || replySize == 0) return 0;
    reply[0] = '\0';
    if (link.portState.load() == 0 || !command) return 0;
    if (!options.lockHeld && !(options.tryLock ? PortTryLock(link) : PortLock(link))) return 0;

    ReplyFramer framer(command, reply, replySize);
    bool failed = false;
    {
        std::shared_lock<std::shared_mutex> io(link.ioGuard);
        const int fd = link.fd;
        if (fd < 0 || link.portState.load() == 0) failed = true;
        if (!failed) {
            // Stray bytes first: a line begun before this command is finished, not taken
            // for the reply.
            ReplyFramer stray(nullptr, nullptr, 0);
            stray.ResumeLine(TakePartialLine(link));
            if (!ReadInto(fd, stray, 0, 4096, nullptr)) failed = true;
            QueueUnsolicited(link, stray.TakeUnsolicited());
            framer.ResumeLine(stray.PartialLine());
        }
        const size_t commandLength = failed ? 0 : std::strlen(command);
        if (!failed && link.echo.load() == EchoMode::Silent) {
            failed = !WriteAll(fd, command, commandLength);
        } else {
            // The card echoes each byte as it takes it: write one, read one. A modem that
            // stays silent after the first byte does not echo, and is not waited for again.
            for (size_t i = 0; !failed && i < commandLength; ++i) {
                if (!WriteByte(fd, command[i])) break;
                if (link.echo.load() == EchoMode::Silent || !framer.EchoPending()) continue;
                char byte;
                ReadResult r = ReadByte(fd, &byte, kReadTimeoutMs);
                if (r == ReadResult::Failed) break;
                if (r == ReadResult::Silent) {
                    if (i == 0 && link.echo.load() == EchoMode::Unknown)
                        link.echo.store(EchoMode::Silent);
                    continue;
                }
                framer.Feed(byte);  // the echo, or the start of something else: kept
            }
        }
        // No overall limit unless the caller sets one: a network operation may take many
        // seconds. Closing the port or a cancel is what ends a wait for a card that never
        // answers.
        int waited = 0;
        bool cancelled = false, timedOut = false;
        while (!failed && !framer.HeardAnything()) {
            Sleep(link, kAnswerPollMs);
            waited += kAnswerPollMs;
            if (options.answerLimitMs > 0 && waited >= options.answerLimitMs) timedOut = true;
            if (link.portState.load() == 0 || TakeCancel(options) || timedOut) {
                cancelled = true;
                break;
            }
            char byte;
            ReadResult r = ReadByte(fd, &byte, kReadTimeoutMs);
            if (r == ReadResult::Failed) failed = true;
            if (r == ReadResult::Byte) framer.Feed(byte);
            waited += r == ReadResult::Silent ? kReadTimeoutMs : 0;
        }
        if (cancelled && options.abortOnCancel && link.portState.load() != 0) {
            // Any byte takes a dial back; its result ("NO CARRIER") is read here so that it
            // does not answer the next command.
            if (WriteByte(fd, '\r')) {
                char byte;
                for (int silent = 0; !framer.Complete() && silent < kAbortResultMs;) {
                    ReadResult r = ReadByte(fd, &byte, kReadTimeoutMs);
                    if (r == ReadResult::Failed) break;
                    if (r == ReadResult::Byte)
                        framer.Feed(byte);
                    else
                        silent += kReadTimeoutMs;
                }
            }
        }
        // Only an exchange that had to have an answer within its limit counts as unanswered;
        // a cancel or a closing port says nothing of the card.
        if (timedOut && !framer.HeardAnything()) ++link.unansweredInRow;
        if (cancelled) failed = true;
        // The rest, until the card falls silent after its final result. Unsolicited lines
        // that came first are not the reply: their silence goes on counting as the wait.
        int silentMs = 0;
        while (!failed) {
            char byte;
            ReadResult r = ReadByte(fd, &byte, kReadTimeoutMs);
            if (r == ReadResult::Failed) {
                failed = true;
                break;
            }
            if (r == ReadResult::Byte) {
                framer.Feed(byte);
                silentMs = 0;
                // A ring that came inside the reply or after it is handed on as soon as the
                // final result is in, rather than after the card falls silent: nothing of the
                // reply follows its final result.
                if (!framer.Complete() || !framer.EventsWaiting()) continue;
                // The result line's "\n" still belongs to the reply.
                if (byte == '\r' && ReadByte(fd, &byte, kInterByteMs) == ReadResult::Byte) {
                    framer.Feed(byte);
                    if (byte != '\n') continue;
                }
                break;
            }
            if (framer.Complete()) break;
            silentMs += kReadTimeoutMs;
            if (link.portState.load() == 0 || TakeCancel(options)) {
                failed = true;
                break;
            }
            const bool begun = framer.Length() > 0;
            if (begun && silentMs >= kMissingResultMs) break;
            if (!begun && options.answerLimitMs > 0 && waited + silentMs >= options.answerLimitMs)
                break;
        }
        if (framer.HeardAnything()) link.unansweredInRow.store(0);
        if (!failed) {
            if (framer.EchoSeen())
                link.echo.store(EchoMode::Echoes);
            else if (link.echo.load() == EchoMode::Unknown && framer.Length() > 0)
                link.echo.store(EchoMode::Silent);
            KeepPartialLine(link, framer.PartialLine());
        }
    }
    if (!options.lockHeld) PortUnlock(link);
    QueueUnsolicited(link, framer.TakeUnsolicited());
    if (failed) {
        reply[0] = '\0';
        return 0;
    }
    const unsigned length = framer.Length();
    return length < replySize ? length : static_cast<unsigned>(replySize - 1);
}

namespace {

// Takes in what the card sent by itself while no exchange ran: its unsolicited lines are
// queued, a line cut by the end of the read waits for the rest.
void TakeUnsolicitedBytes(Link& link) {
    if (!PortTryLock(link)) return;
    std::vector<std::string> lines;
    {
        std::shared_lock<std::shared_mutex> io(link.ioGuard);
        if (link.fd >= 0) {
            ReplyFramer framer(nullptr, nullptr, 0);
            framer.ResumeLine(TakePartialLine(link));
            // The bytes of a line follow each other closely; 20 ms of silence ends the read.
            ReadInto(link.fd, framer, kInterByteMs, 4096, nullptr);
            KeepPartialLine(link, framer.PartialLine());
            lines = framer.TakeUnsolicited();
        }
    }
    PortUnlock(link);
    QueueUnsolicited(link, lines);
}

// Waits until the card sends something, the listener is woken, or the time is up; returns
// early in each case. While an exchange holds the port its bytes are the exchange's: the wait
// then is for the port to come free.
void ListenerWait(Link& link, std::chrono::steady_clock::time_point until) {
    for (;;) {
        const auto now = std::chrono::steady_clock::now();
        if (now >= until || link.portState.load() == 0) return;
        const int left =
            static_cast<int>(
                std::chrono::duration_cast<std::chrono::milliseconds>(until - now).count()) +
            1;
        if (link.portState.load() == 2) {
            std::unique_lock<std::mutex> lock(link.portMutex);
            link.portChanged.wait_for(lock, std::chrono::milliseconds(left),
                                      [&] { return link.portState.load() != 2; });
            continue;
        }
        pollfd p[2] = {{link.fd, POLLIN, 0}, {link.wakeFd, POLLIN, 0}};
        const int ready = poll(p, link.wakeFd >= 0 ? 2 : 1, left);
        if (ready < 0 && errno == EINTR) continue;
        if (ready <= 0) return;
        if (p[1].revents & POLLIN) {
            uint64_t count;
            (void)!read(link.wakeFd, &count, sizeof count);
            return;
        }
        if (p[0].revents & (POLLHUP | POLLERR | POLLNVAL)) {
            // A vanished device: nothing to read until the card watch closes the port.
            Sleep(link, kAnswerPollMs);
            continue;
        }
        if (p[0].revents & POLLIN) return;
    }
}

void ListenerThread(Link* link) {
    using std::chrono::steady_clock;
    bool callSeen = false;
    bool silenceReported = false;
    auto nextPoll = steady_clock::now();
    while (link->portState.load() > 0) {
        if (link->portState.load() != 2) {
            TakeUnsolicitedBytes(*link);
            int rings = 0;
            if (link->events) link->events->DispatchAll(&rings);
            // A ring taken in is a call seen: if the caller gives up before a poll finds the
            // call, the next empty call list still ends it.
            if (rings > 0) callSeen = true;
        }
        // A poll that falls due while an exchange holds the port waits for its turn in the
        // port's queue: looking again and again until the port is free would spin.
        if (link->portState.load() != 0 && steady_clock::now() >= nextPoll) {
            nextPoll = steady_clock::now() + std::chrono::milliseconds(link->listenerPassMs);
            int state = -1, mode = -1;
            std::string number;
            const int calls = QueryCallState(*link, &state, &mode, &number);
            // Exchanges that any card answers at once have gone unanswered several times in a
            // row, over several seconds: the card is taken for gone, once.
            const bool silent = link->unansweredInRow.load() >= kUnansweredGone;
            if (silent && !silenceReported && link->portState.load() > 0 && link->postToMain)
                link->postToMain(kMsgCardSilent);
            silenceReported = silent;
            if (calls == 1) {
                if (state == 0 && mode == 0) {
                    if (link->postToMain) link->postToMain(kMsgCallActive);
                    callSeen = true;
                } else if (state == 4 && mode == 0 && link->postToMain) {
                    {
                        std::lock_guard<std::mutex> lock(link->ringingMutex);
                        link->ringingNumber = number;
                    }
                    link->postToMain(kMsgCallRinging);
                }
                if (state == 4 && mode == 0 && !callSeen) {
                    // A call is ringing but no ring text arrived: act as if it had.
                    static const char kRing[] = "\r\n+CRING: VOICE\r\n\r\nOK\r\n";
                    if (link->events) {
                        link->events->UnsolicitedScan(kRing, sizeof kRing - 1);
                        link->events->DispatchAll(nullptr);
                    }
                    callSeen = true;
                }
            } else if (calls == 0 && callSeen) {
                // Only a clean "no call" ends a call: a damaged reply says nothing.
                if (link->postToMain) link->postToMain(kMsgCallListEmpty);
                callSeen = false;
            }
            continue;  // what came in during the poll is taken in at once
        }
        ListenerWait(*link, nextPoll);
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

    if (link.wakeFd < 0) link.wakeFd = eventfd(0, EFD_CLOEXEC | EFD_NONBLOCK);
    {
        std::lock_guard<std::mutex> lock(link.portMutex);
        link.fd = fd;
        link.echo.store(EchoMode::Unknown);
        link.unansweredInRow.store(0);
        TakePartialLine(link);
        ++link.openCount;
        link.servingTicket = link.nextTicket;  // nobody from an earlier opening is waiting
        link.portState.store(1);
    }
    if (!ModemInit(link)) {
        PortClose(link);
        return 0;
    }
    link.firmwareVersion = GetFirmwareVersion(link, nullptr, 0);
    // Operators in numeric form where the modem lets the client choose; the card always
    // reports them so, and a refusal changes nothing.
    char reply[256];
    AtCommandWithin(link, "AT+COPS=3,2\r", reply, sizeof reply, kQueryAnswerLimitMs);
    link.listener = std::thread(ListenerThread, &link);
    return 1;
}

void PortClose(Link& link) {
    {
        std::lock_guard<std::mutex> lock(link.portMutex);
        link.portState.store(0);
    }
    link.portChanged.notify_all();
    WakeListener(link);
    if (link.listener.joinable() && link.listener.get_id() != std::this_thread::get_id())
        link.listener.join();
    std::unique_lock<std::shared_mutex> io(link.ioGuard);
    if (link.fd >= 0) {
        close(link.fd);
        link.fd = -1;
    }
}

std::string RingingNumber(Link& link) {
    std::lock_guard<std::mutex> lock(link.ringingMutex);
    return link.ringingNumber;
}

int PortTryLock(Link& link) {
    if (!LockWithin(link.portMutex, kMutexWaitMs)) return 0;
    std::lock_guard<std::mutex> lock(link.portMutex, std::adopt_lock);
    // Free and nobody waiting for a turn.
    if (link.portState.load() != 1 || link.servingTicket != link.nextTicket) return 0;
    ++link.nextTicket;
    ++link.servingTicket;
    link.portState.store(2);
    return 1;
}

int PortLock(Link& link) {
    std::unique_lock<std::mutex> lock(link.portMutex);
    const unsigned long opening = link.openCount;
    const unsigned long ticket = link.nextTicket++;
    for (;;) {
        const int state = link.portState.load();
        if (state == 0 || link.openCount != opening) {
            // The port closed: nobody waits for it any more.
            if (link.servingTicket <= ticket) link.servingTicket = ticket + 1;
            link.portChanged.notify_all();
            return 0;
        }
        if (state == 1 && link.servingTicket == ticket) {
            ++link.servingTicket;
            link.portState.store(2);
            return 1;
        }
        link.portChanged.wait(lock);
    }
}

void PortUnlock(Link& link) {
    if (!LockWithin(link.portMutex, kMutexWaitMs)) return;
    {
        std::lock_guard<std::mutex> lock(link.portMutex, std::adopt_lock);
        // A port closed meanwhile stays closed.
        if (link.portState.load() == 2) link.portState.store(1);
    }
    link.portChanged.notify_all();
}

unsigned AtCommand(Link& link, const char* command, char* reply, size_t replySize) {
    return AtExchange(link, command, reply, replySize, ExchangeOptions{});
}

unsigned AtCommandTry(Link& link, const char* command, char* reply, size_t replySize) {
    ExchangeOptions options;
    options.tryLock = true;
    return AtExchange(link, command, reply, replySize, options);
}

unsigned AtCommandWithin(Link& link, const char* command, char* reply, size_t replySize,
                         int limitMs) {
    ExchangeOptions options;
    options.answerLimitMs = limitMs;
    return AtExchange(link, command, reply, replySize, options);
}

unsigned AtReadPending(Link& link, char* buffer, size_t limit) {
    if (!buffer) return 0;
    buffer[0] = '\0';
    if (link.portState.load() == 0 || !PortTryLock(link)) return 0;
    unsigned count = 0;
    std::vector<std::string> lines;
    {
        std::shared_lock<std::shared_mutex> io(link.ioGuard);
        // Only what is already there: this drain must not add a wait to every command.
        ReplyFramer framer(nullptr, nullptr, 0);
        framer.ResumeLine(TakePartialLine(link));
        char byte;
        while (link.fd >= 0 && count < limit && ReadByte(link.fd, &byte, 0) == ReadResult::Byte) {
            buffer[count++] = byte;
            framer.Feed(byte);
        }
        buffer[count] = '\0';
        KeepPartialLine(link, framer.PartialLine());
        lines = framer.TakeUnsolicited();
    }
    PortUnlock(link);
    QueueUnsolicited(link, lines);
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
        // A card that does not answer its start-up is not waited for: the watch tries again.
        // The limit is any query's: a card on a loaded machine may take more than a second.
        if (AtCommandWithin(link, command, reply, sizeof reply, kQueryAnswerLimitMs) == 0) return 0;
    }
    return 1;
}

}  // namespace vqm
