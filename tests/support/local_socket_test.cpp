// Window messages and line requests between programs over local sockets.
#include "support/local_socket.h"

#include <errno.h>
#include <fcntl.h>
#include <poll.h>
#include <sys/resource.h>
#include <sys/socket.h>
#include <sys/stat.h>
#include <sys/un.h>
#include <sys/wait.h>
#include <time.h>
#include <unistd.h>

#include <gtest/gtest.h>

#include <atomic>
#include <cstring>
#include <filesystem>
#include <thread>
#include <vector>

#include "tests/common/temp_folder.h"
#include "tests/common/wait.h"

namespace vqm {
namespace {

using std::chrono::milliseconds;

// A raw connection to path; -1 when it is not made.
int DialSocket(const std::string& path, int flags) {
    int fd = socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC | flags, 0);
    if (fd < 0) return -1;
    sockaddr_un address{};
    address.sun_family = AF_UNIX;
    std::strcpy(address.sun_path, path.c_str());
    if (connect(fd, reinterpret_cast<sockaddr*>(&address), sizeof address) != 0) {
        close(fd);
        return -1;
    }
    return fd;
}

class LocalSocketTest : public ::testing::Test {
  protected:
    ~LocalSocketTest() override {
        for (int fd : held_)
            close(fd);
    }
    // A raw connection to path_, kept until the test ends; -1 when it is not made.
    int Dial(int flags = 0) {
        const int fd = DialSocket(path_, flags);
        if (fd >= 0) held_.push_back(fd);
        return fd;
    }
    static int OpenDescriptors() {
        int count = 0;
        for (const auto& entry : std::filesystem::directory_iterator("/proc/self/fd")) {
            (void)entry;
            ++count;
        }
        return count;
    }
    // Processor time this process spends over a stretch in which nothing should happen.
    static milliseconds CpuWhileIdle(milliseconds stretch) {
        timespec before{}, after{};
        clock_gettime(CLOCK_PROCESS_CPUTIME_ID, &before);
        std::this_thread::sleep_for(stretch);  // measuring, not synchronising
        clock_gettime(CLOCK_PROCESS_CPUTIME_ID, &after);
        return milliseconds((after.tv_sec - before.tv_sec) * 1000 +
                            (after.tv_nsec - before.tv_nsec) / 1'000'000);
    }
    static std::string Echo(const std::string& line) { return line; }

    const testing::TempFolder temp_;
    const std::string path_ = WindowSocketPath(temp_ / "run", "TEST_CLASS");
    std::vector<int> held_;
};

TEST_F(LocalSocketTest, WindowMessagesReachTheProcedureAndReturnItsResult) {
    LineServer server;
    ASSERT_TRUE(server.Start(path_, [](const std::string& line) {
        return AnswerWindowMessage(line, [](unsigned msg, long w, long l) {
            return msg == 2028 ? 2L : static_cast<long>(msg) + w * 10 + l;
        });
    }));
    EXPECT_EQ(SendWindowMessage(path_, 2028, 0, 0), 2L);
    EXPECT_EQ(SendWindowMessage(path_, 100, -3, 7), 77L);
    EXPECT_TRUE(ServerAnswers(path_));
    // Malformed requests are answered, not fatal: the caller sees 0.
    EXPECT_EQ(SendLine(path_, "2028", 1000), "0");
    EXPECT_EQ(SendLine(path_, "2028 0 0 junk", 1000), "0");
    EXPECT_EQ(SendLine(path_, "", 1000), "0");
}

TEST_F(LocalSocketTest, NoServerMeansNoWindow) {
    EXPECT_FALSE(ServerAnswers(path_));
    EXPECT_EQ(SendWindowMessage(path_, 2028, 0, 0), std::nullopt);
    LineServer server;
    ASSERT_TRUE(server.Start(path_, [](const std::string&) { return "1"; }));
    server.Stop();
    EXPECT_FALSE(ServerAnswers(path_));
    EXPECT_EQ(SendWindowMessage(path_, 2028, 0, 0), std::nullopt);
}

TEST_F(LocalSocketTest, ASecondServerIsRefusedButAStaleSocketIsReplaced) {
    LineServer first, second;
    ASSERT_TRUE(first.Start(path_, [](const std::string&) { return "first"; }));
    EXPECT_FALSE(second.Start(path_, [](const std::string&) { return "second"; }));
    EXPECT_EQ(SendLine(path_, "x", 1000), "first");
    first.Stop();

    // A program that died leaves its socket file behind with nobody listening.
    int fd = socket(AF_UNIX, SOCK_STREAM, 0);
    sockaddr_un address{};
    address.sun_family = AF_UNIX;
    std::strcpy(address.sun_path, path_.c_str());
    ASSERT_EQ(bind(fd, reinterpret_cast<sockaddr*>(&address), sizeof address), 0);
    close(fd);
    ASSERT_TRUE(second.Start(path_, [](const std::string&) { return "second"; }));
    EXPECT_EQ(SendLine(path_, "x", 1000), "second");
}

TEST_F(LocalSocketTest, ASilentClientHoldsUpNobodyAndRepliesStayOneLine) {
    LineServer server;
    ASSERT_TRUE(server.Start(path_, [](const std::string& line) { return line + "\nand more"; }));
    int idle = socket(AF_UNIX, SOCK_STREAM, 0);
    sockaddr_un address{};
    address.sun_family = AF_UNIX;
    std::strcpy(address.sun_path, path_.c_str());
    ASSERT_EQ(connect(idle, reinterpret_cast<sockaddr*>(&address), sizeof address), 0);
    ASSERT_EQ(write(idle, "half a requ", 11), 11);  // and never the line end

    std::atomic<int> answered{0};
    std::vector<std::thread> clients;
    for (int i = 0; i < 8; ++i)
        clients.emplace_back([&, i] {
            if (SendLine(path_, "ping " + std::to_string(i), 2000) ==
                "ping " + std::to_string(i) + " and more")
                ++answered;
        });
    for (std::thread& client : clients)
        client.join();
    EXPECT_EQ(answered.load(), 8);
    close(idle);
}

TEST_F(LocalSocketTest, AServerThatNeverAnswersTimesOut) {
    LineServer server;
    std::atomic<bool> release{false};
    ASSERT_TRUE(server.Start(path_, [&](const std::string&) {
        while (!release)
            std::this_thread::sleep_for(std::chrono::milliseconds(5));
        return std::string("late");
    }));
    const auto start = std::chrono::steady_clock::now();
    EXPECT_EQ(SendWindowMessage(path_, 2028, 0, 0, 200), std::nullopt);
    EXPECT_LT(std::chrono::steady_clock::now() - start, std::chrono::seconds(2));
    release = true;
}


// Window messages are for the user's own programs: the socket and its folder are closed to
// others, and a client of another user is refused even where a careless mode lets it connect.
TEST_F(LocalSocketTest, OnlyTheUsersOwnProgramsAreServed) {
    LineServer server;
    ASSERT_TRUE(server.Start(path_, [](const std::string&) { return std::string("served"); }));
    struct stat info {};
    ASSERT_EQ(stat(path_.c_str(), &info), 0);
    EXPECT_EQ(info.st_mode & 0777, 0600u);
    ASSERT_EQ(stat((temp_ / "run").c_str(), &info), 0);
    EXPECT_EQ(info.st_mode & 0777, 0700u);
    EXPECT_EQ(SendLine(path_, "x", 2000), "served");

    if (geteuid() != 0) GTEST_SKIP() << "a second user needs root to play";
    const struct {
        const char* setting;
        mode_t folderMode, socketMode;
    } settings[] = {
        {"as made", 0700, 0600},  // not even reached
        {"opened to all", 0777, 0777},  // only the credentials stand in the way
    };
    for (const auto& setting : settings) {
        SCOPED_TRACE(setting.setting);
        ASSERT_EQ(chmod(temp_.Path().c_str(), setting.folderMode | 0700), 0);
        ASSERT_EQ(chmod((temp_ / "run").c_str(), setting.folderMode), 0);
        ASSERT_EQ(chmod(path_.c_str(), setting.socketMode), 0);
        const pid_t child = fork();
        if (child == 0) {
            if (setgid(65534) != 0 || setuid(65534) != 0) _exit(3);
            _exit(SendLine(path_, "x", 2000) ? 0 : 1);
        }
        int status = 0;
        ASSERT_EQ(waitpid(child, &status, 0), child);
        ASSERT_TRUE(WIFEXITED(status));
        EXPECT_EQ(WEXITSTATUS(status), 1) << "another user's request was answered";
    }
    EXPECT_EQ(SendLine(path_, "x", 2000), "served");
}

// A client that sends requests and never reads its replies cannot stop the server: it is
// dropped once its unread replies pass the limit, and the others are answered meanwhile.
TEST_F(LocalSocketTest, AClientThatNeverReadsIsDroppedAndOthersAreServed) {
    LineServer server;
    ASSERT_TRUE(server.Start(path_, [](const std::string&) { return std::string(1000, 'r'); }));
    const int flood = Dial(SOCK_NONBLOCK);
    ASSERT_GE(flood, 0);
    std::string requests;
    for (int i = 0; i < 100 * 1024; ++i)
        requests += "x\n";  // 200 KB
    size_t sent = 0;
    const bool dropped = testing::WaitFor(
        [&] {
            while (sent < requests.size()) {
                ssize_t n = send(flood, requests.data() + sent, requests.size() - sent,
                                 MSG_NOSIGNAL);
                if (n > 0) {
                    sent += static_cast<size_t>(n);
                    continue;
                }
                if (n < 0 && errno == EAGAIN) break;
                return true;  // EPIPE or ECONNRESET: the server let go of it
            }
            pollfd p{flood, 0, 0};
            return poll(&p, 1, 0) == 1 && (p.revents & (POLLHUP | POLLERR));
        },
        milliseconds(10000));
    EXPECT_TRUE(dropped);
    EXPECT_EQ(SendLine(path_, "x", 2000), std::string(1000, 'r'));
}

// A connection that says nothing is let go after the idle time; one that speaks is kept.
TEST_F(LocalSocketTest, SilentClientsAreDroppedAfterTheIdleTime) {
    LineServer server;
    LineServerLimits limits;
    limits.idle = milliseconds(300);
    server.SetLimits(limits);
    ASSERT_TRUE(server.Start(path_, Echo));
    const int silent = Dial(), talking = Dial();
    ASSERT_GE(silent, 0);
    ASSERT_GE(talking, 0);
    auto closedByServer = [](int fd) {
        pollfd p{fd, POLLIN, 0};
        char byte;
        return poll(&p, 1, 0) == 1 && recv(fd, &byte, 1, MSG_DONTWAIT) == 0;
    };
    std::string heard;
    const bool dropped = testing::WaitFor(
        [&] {
            // The talking client says something every pass and reads its echo.
            if (send(talking, "hi\n", 3, MSG_NOSIGNAL) == 3) {
                char buffer[64];
                pollfd p{talking, POLLIN, 0};
                if (poll(&p, 1, 50) == 1) {
                    const ssize_t n = recv(talking, buffer, sizeof buffer, MSG_DONTWAIT);
                    if (n > 0) heard.assign(buffer, static_cast<size_t>(n));
                }
            }
            return closedByServer(silent);
        },
        milliseconds(5000));
    EXPECT_TRUE(dropped);
    EXPECT_FALSE(closedByServer(talking));
    EXPECT_EQ(heard.substr(0, 3), "hi\n");
}

// A crowd of idle connections (more than the server takes) costs neither descriptors nor
// processor time, and a caller that says something is still answered.
TEST_F(LocalSocketTest, AnIdleCrowdTakesNeitherDescriptorsNorTheProcessor) {
    constexpr int kCrowd = 1100;
    rlimit limit{};
    ASSERT_EQ(getrlimit(RLIMIT_NOFILE, &limit), 0);
    const rlimit saved = limit;
    if (limit.rlim_cur < kCrowd + 200) {
        limit.rlim_cur = std::min<rlim_t>(limit.rlim_max, kCrowd + 200);
        setrlimit(RLIMIT_NOFILE, &limit);
    }
    if (limit.rlim_cur < kCrowd + 200) GTEST_SKIP() << "descriptor limit too low";

    LineServer server;
    LineServerLimits limits;
    limits.maxClients = 32;
    server.SetLimits(limits);
    ASSERT_TRUE(server.Start(path_, [](const std::string& line) {
        return AnswerWindowMessage(line, [](unsigned msg, long, long) { return long(msg) - 2027; });
    }));
    const int before = OpenDescriptors();
    for (int i = 0; i < kCrowd; ++i)
        ASSERT_GE(Dial(), 0) << "connection " << i;
    // The server's side of the crowd settles at its cap.
    EXPECT_TRUE(testing::WaitFor(
        [&] { return OpenDescriptors() - before <= kCrowd + 32; }, milliseconds(5000)))
        << OpenDescriptors() - before - kCrowd << " held by the server";
    EXPECT_LT(CpuWhileIdle(milliseconds(500)).count(), 100);
    EXPECT_EQ(SendWindowMessage(path_, 2028, 0, 0, 2000), 1L);  // the card manager still answers
    for (int fd : held_)
        close(fd);
    held_.clear();
    setrlimit(RLIMIT_NOFILE, &saved);
}

// Out of descriptors, the server pauses its accepting instead of spinning on a listening socket
// that stays readable, and serves again once descriptors are free.
TEST_F(LocalSocketTest, RunningOutOfDescriptorsBacksOffInsteadOfSpinning) {
    LineServer server;
    LineServerLimits limits;
    limits.maxClients = 100000;  // the descriptors, not the cap, run out
    server.SetLimits(limits);
    ASSERT_TRUE(server.Start(path_, Echo));
    rlimit saved{};
    ASSERT_EQ(getrlimit(RLIMIT_NOFILE, &saved), 0);
    // Out of descriptors, only plain calls: the undefined-behaviour checks of a member call
    // may need a descriptor of their own.
    const std::string path = path_;
    rlimit low = saved;
    low.rlim_cur = static_cast<rlim_t>(OpenDescriptors() + 40);
    ASSERT_EQ(setrlimit(RLIMIT_NOFILE, &low), 0);
    // Every descriptor taken but one, which a caller's connection uses: it waits in the
    // queue, and the server, holding no client it could let go, has none to take it with.
    std::vector<int> fillers;
    for (int fd; (fd = open("/dev/null", O_RDONLY | O_CLOEXEC)) >= 0;)
        fillers.push_back(fd);
    ASSERT_FALSE(fillers.empty());
    close(fillers.back());
    fillers.pop_back();
    const int queued = DialSocket(path, 0);
    const milliseconds busy = CpuWhileIdle(milliseconds(500));
    for (int fd : fillers)
        close(fd);
    ASSERT_EQ(setrlimit(RLIMIT_NOFILE, &saved), 0);
    ASSERT_GE(queued, 0);
    held_.push_back(queued);
    EXPECT_LT(busy.count(), 150) << "the server spun while out of descriptors";
    EXPECT_EQ(SendLine(path_, "again", 2000), "again");
    // The caller that waited in the queue is served too.
    ASSERT_EQ(write(queued, "queued\n", 7), 7);
    pollfd p{queued, POLLIN, 0};
    ASSERT_EQ(poll(&p, 1, 2000), 1);
    char reply[16] = {};
    EXPECT_EQ(read(queued, reply, sizeof reply - 1), 7);
    EXPECT_STREQ(reply, "queued\n");
}

// A server that is stopped (here: one that never accepts) with its queue full must not hold
// the caller for ever: the caller's time-out bounds the connection as well as the reply.
TEST_F(LocalSocketTest, AStoppedServerWithAFullQueueIsBoundedByTheTimeOut) {
    std::filesystem::create_directories(temp_ / "run");
    const int listener = socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0);
    sockaddr_un address{};
    address.sun_family = AF_UNIX;
    std::strcpy(address.sun_path, path_.c_str());
    ASSERT_EQ(bind(listener, reinterpret_cast<sockaddr*>(&address), sizeof address), 0);
    ASSERT_EQ(listen(listener, 0), 0);
    int queued = 0;
    while (queued < 1000 && Dial(SOCK_NONBLOCK) >= 0)
        ++queued;
    ASSERT_LT(queued, 1000) << "the queue never filled";

    std::atomic<bool> done{false};
    std::optional<long> result = 5;
    bool answers = false;
    const auto start = std::chrono::steady_clock::now();
    std::thread caller([&] {
        result = SendWindowMessage(path_, 2028, 0, 0, 300);
        answers = ServerAnswers(path_, 300);
        done = true;
    });
    const bool bounded = testing::WaitFor([&] { return done.load(); }, milliseconds(5000));
    if (!bounded) shutdown(listener, SHUT_RDWR);  // lets a caller stuck in connect go
    caller.join();
    close(listener);
    ASSERT_TRUE(bounded) << "the caller waited past its time-out";
    EXPECT_EQ(result, std::nullopt);
    EXPECT_TRUE(answers);  // there, only not taking calls
    EXPECT_LT(std::chrono::steady_clock::now() - start, milliseconds(2000));
}

}  // namespace
}  // namespace vqm
