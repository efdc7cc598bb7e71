// Window messages and line requests between programs over local sockets.
#include "support/local_socket.h"

#include <sys/socket.h>
#include <sys/un.h>
#include <unistd.h>

#include <gtest/gtest.h>

#include <atomic>
#include <cstring>
#include <thread>

#include "tests/common/temp_folder.h"

namespace vqm {
namespace {

class LocalSocketTest : public ::testing::Test {
  protected:
    const testing::TempFolder temp_;
    const std::string path_ = WindowSocketPath(temp_ / "run", "TEST_CLASS");
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

}  // namespace
}  // namespace vqm
