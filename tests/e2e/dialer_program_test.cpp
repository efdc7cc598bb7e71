// The dialer and the simulated card as two programs, started as a user starts them, each
// with its own sockets in a private runtime folder. What the dialer shows is read from its
// --ui-log record; its boxes are answered by --answer-boxes.
#include <gtest/gtest.h>

#include <chrono>
#include <cstring>
#include <filesystem>
#include <fstream>
#include <string>
#include <thread>
#include <vector>

#include "support/local_socket.h"
#include "tests/common/program_host.h"
#include "tests/common/temp_folder.h"

namespace vqm {
namespace {

namespace fs = std::filesystem;
using namespace std::chrono_literals;
using testing::Background;
using testing::RunShell;
using testing::WaitFor;

constexpr char kPowerUpQuestion[] =
    "box VQM Dialer: Tavro Card Phone 2.0 is not powered up, would you like to power it up now?";

// Every test runs on the card's own dialect and on a standard 27.007 modem.
class DialerProgramTest : public ::testing::TestWithParam<const char*>,
                          protected testing::ProgramHost {
  protected:
    // The card unpowered unless options say otherwise, taking half a second to power up.
    void StartCard(const std::string& options = "") {
        ProgramHost::StartCard(std::string("--dialect ") + GetParam() + " --power-up-ms 500 " +
                               options);
    }
    bool Standard() const { return std::string(GetParam()) == "standard"; }
    // A key of the DialPad, as a click on it.
    void Key(int id) { Command(id); }
    void Type(const std::string& digits) {
        for (char c : digits)
            Key(1126 + (c - '0'));
    }
    // The numbers of a call log, oldest first: 64-byte records, the number first.
    std::vector<std::string> Logged(int log) const {
        std::ifstream file(temp_ / ("data/VQMFull/callog" + std::to_string(log) + ".db"),
                           std::ios::binary);
        std::vector<std::string> numbers;
        char record[64];
        while (file.read(record, sizeof record))
            numbers.emplace_back(record, strnlen(record, 32));
        return numbers;
    }
};

TEST_P(DialerProgramTest, PowerUpAnsweredOkConnectsAndTheDialerEndsCleanly) {
    ASSERT_NO_FATAL_FAILURE(StartCard());
    ASSERT_NO_FATAL_FAILURE(StartDialer("--answer-boxes ok"));
    ASSERT_TRUE(LogShows(std::string(kPowerUpQuestion) + " -> OK")) << Log();
    ASSERT_TRUE(LogShows("status Initializing...")) << Log();
    ASSERT_TRUE(LogShows("card 2 connected")) << Log();
    EXPECT_LT(Log().find("window shown"), Log().find("card 2 connected"));

    // About reads the firmware from the card (a modem that is not the card has no version).
    EXPECT_EQ(Command(40018, 10000), 0L);
    if (!Standard())
        EXPECT_TRUE(LogShows("dialog About: Tavro Card Phone 2.0 Firmware Version 4.00")) << Log();
    else
        EXPECT_TRUE(LogShows("dialog About")) << Log();

    // A second start brings the first forward and goes away.
    auto [output, status] = RunShell(Environment() + VQM_DIALER);
    EXPECT_EQ(status, 0) << output;
    EXPECT_TRUE(LogShows("foreground")) << Log();

    // Exit from the File menu: the dialer ends by itself, leaving nothing running and
    // nothing answering for it.
    Command(kExit);
    EXPECT_EQ(dialer_.WaitExit(10s), 0) << Read(temp_ / "dialer.out");
    EXPECT_FALSE(ServerAnswers(DialerSocket()));
    EXPECT_EQ(Ctl("status").first.find("call=none") != std::string::npos, true);
}

TEST_P(DialerProgramTest, PullingTheCardDropsTheConnectionAndAStopSignalEndsTheDialer) {
    ASSERT_NO_FATAL_FAILURE(StartCard("--powered"));
    ASSERT_NO_FATAL_FAILURE(StartDialer("--answer-boxes ok"));
    ASSERT_TRUE(LogShows("card 2 connected")) << Log();
    EXPECT_EQ(Count("box "), 0u);  // a powered card is not asked about

    EXPECT_EQ(Ctl("pull").second, 0);
    ASSERT_TRUE(LogShows("card 1 not connected")) << Log();
    ASSERT_TRUE(LogShows("status No Card Phone inserted.")) << Log();

    // Ctrl-C, or a stop from the session, ends it as Exit does.
    kill(dialer_.Pid(), SIGTERM);
    EXPECT_EQ(dialer_.WaitExit(10s), 0) << Read(temp_ / "dialer.out");
}

TEST_P(DialerProgramTest, DecliningThePowerUpAsksOnceAndSaysTheCardIsAbsentOnce) {
    ASSERT_NO_FATAL_FAILURE(StartCard());
    ASSERT_NO_FATAL_FAILURE(StartDialer("--answer-boxes cancel"));
    ASSERT_TRUE(LogShows(std::string(kPowerUpQuestion) + " -> Cancel")) << Log();
    ASSERT_TRUE(LogShows("status No Card Phone inserted.")) << Log();
    // Three more passes of the once-a-second watch change nothing.
    std::this_thread::sleep_for(3s);
    EXPECT_EQ(Count("box "), 1u) << Log();
    EXPECT_EQ(Count("status "), 1u) << Log();
    EXPECT_EQ(Count("card 2"), 0u) << Log();
}

// Rings, caller ids, answers, rejects, hang-ups on both sides, a dial and a busy number, all
// through the real program; the log of what the window showed tells what happened.
TEST_P(DialerProgramTest, CallsComeAndGoAndAreLogged) {
    ASSERT_NO_FATAL_FAILURE(StartCard("--powered"));
    ASSERT_NO_FATAL_FAILURE(StartDialer("--answer-boxes ok"));
    ASSERT_TRUE(LogShows("card 2 connected")) << Log();
    // The operator, in whatever form the modem reports it.
    EXPECT_TRUE(LogShows("status COSMOTE")) << Log();

    // A ring, the caller's number, answered here, ended by the far end.
    EXPECT_EQ(Ctl("ring +447700900123").second, 0);
    ASSERT_TRUE(LogShows("status Incoming call")) << Log();
    ASSERT_TRUE(LogShows("status +447700900123")) << Log();
    Key(1138);
    ASSERT_TRUE(LogShows("status Voice call")) << Log();
    // Line noise in the middle of the call is no empty call list: the call stays up through
    // the next two polls (a wrong end would show within one).
    EXPECT_EQ(Ctl("garbage 500").second, 0);
    std::this_thread::sleep_for(2s);
    EXPECT_EQ(Count("status Call ended"), 0u) << Log();
    EXPECT_NE(Ctl("status").first.find("call=active"), std::string::npos);
    EXPECT_EQ(Ctl("remote-hangup").second, 0);
    ASSERT_TRUE(LogShows("status Call ended")) << Log();

    // Rejected with End.
    EXPECT_EQ(Ctl("ring +447700900124").second, 0);
    ASSERT_TRUE(LogShows("status +447700900124")) << Log();
    Key(1139);
    ASSERT_TRUE(LogShows("status Unanswered")) << Log();

    // A caller who gives up at once, and another right behind: both are logged, in order.
    ASSERT_TRUE(
        WaitFor([&] { return Ctl("status").first.find("call=none") != std::string::npos; }));
    EXPECT_EQ(Ctl("ring +447700900125").second, 0);
    ASSERT_TRUE(LogShows("status +447700900125")) << Log();
    EXPECT_EQ(Ctl("caller-hangup").second, 0);
    EXPECT_EQ(Ctl("ring +447700900126").second, 0);
    ASSERT_TRUE(LogShows("status +447700900126")) << Log();
    EXPECT_EQ(Ctl("caller-hangup").second, 0);
    ASSERT_TRUE(WaitFor([&] { return Logged(3).size() == 3; }, 10s)) << Log();
    EXPECT_EQ(Logged(3),
              (std::vector<std::string>{"+447700900124", "+447700900125", "+447700900126"}));
    EXPECT_EQ(Logged(1), std::vector<std::string>{"+447700900123"});

    // A dial answered by the far end and ended here; a busy number. Each starts once the
    // last result's two seconds are over and the pad is idle again.
    ASSERT_TRUE(WaitFor([&] { return Count("status COSMOTE") == 2; })) << Log();
    Type("0123456");
    Key(1138);
    ASSERT_TRUE(LogShows("status Dialing...")) << Log();
    ASSERT_TRUE(
        WaitFor([&] { return Ctl("status").first.find("call=dialing") != std::string::npos; }));
    EXPECT_EQ(Ctl("remote-answer").second, 0);
    ASSERT_TRUE(WaitFor([&] { return Count("status Voice call") == 2; })) << Log();
    Key(1139);
    ASSERT_TRUE(WaitFor([&] { return Count("status Call ended") == 2; })) << Log();
    ASSERT_TRUE(
        WaitFor([&] { return Ctl("status").first.find("call=none") != std::string::npos; }));
    EXPECT_EQ(Ctl("busy 0123457").second, 0);
    ASSERT_TRUE(WaitFor([&] { return Count("status COSMOTE") == 3; })) << Log();
    Type("0123457");
    Key(1138);
    ASSERT_TRUE(LogShows("status Number is busy")) << Log();
    EXPECT_EQ(Logged(2), (std::vector<std::string>{"0123456", "0123457"}));

    kill(dialer_.Pid(), SIGTERM);
    EXPECT_EQ(dialer_.WaitExit(10s), 0) << Read(temp_ / "dialer.out");
}

// A card that stops answering holds up neither the window nor the exit, and is taken for gone
// once it stays silent.
TEST_P(DialerProgramTest, ASilentCardIsTakenForGoneAndTheDialerStillExitsAtOnce) {
    ASSERT_NO_FATAL_FAILURE(StartCard("--powered"));
    ASSERT_NO_FATAL_FAILURE(StartDialer("--answer-boxes ok"));
    ASSERT_TRUE(LogShows("card 2 connected")) << Log();
    EXPECT_EQ(Ctl("silent on").second, 0);
    // Three exchanges in a row without an answer: 10 to 30 s, as their limits go.
    ASSERT_TRUE(LogShows("card silent: taken for gone", 60s)) << Log();
    ASSERT_TRUE(WaitFor([&] { return Count("card 1 not connected") == 2; }, 5s)) << Log();
    EXPECT_EQ(Ctl("silent off").second, 0);
    ASSERT_TRUE(WaitFor([&] { return Count("card 2 connected") == 2; }, 20s)) << Log();

    // Silent again, with a dial under way: Exit ends the program at once all the same.
    ASSERT_TRUE(WaitFor([&] { return Count("status COSMOTE") >= 1; })) << Log();
    EXPECT_EQ(Ctl("silent on").second, 0);
    Type("0123456");
    Key(1138);
    ASSERT_TRUE(LogShows("status Dialing...")) << Log();
    const auto start = std::chrono::steady_clock::now();
    Command(kExit);
    EXPECT_EQ(dialer_.WaitExit(10s), 0) << Read(temp_ / "dialer.out");
    // A bound that catches a wait on the card (the ATH's try is 1 s), not a figure.
    EXPECT_LT(std::chrono::steady_clock::now() - start, 3s);
}

// A card manager that keeps answering "powering up" holds neither the window nor a stop.
TEST_P(DialerProgramTest, AStopWhileTheCardPowersUpEndsTheDialerAtOnce) {
    ProgramHost::StartCard(std::string("--dialect ") + GetParam() + " --power-up-ms 600000");
    ASSERT_NO_FATAL_FAILURE(StartDialer("--answer-boxes ok"));
    ASSERT_TRUE(LogShows(std::string(kPowerUpQuestion) + " -> OK")) << Log();
    // The link finds no card yet; the next passes wait on the card manager, five seconds each.
    ASSERT_TRUE(LogShows("status Initializing...")) << Log();
    const auto start = std::chrono::steady_clock::now();
    kill(dialer_.Pid(), SIGTERM);
    EXPECT_EQ(dialer_.WaitExit(10s), 0) << Read(temp_ / "dialer.out");
    EXPECT_LT(std::chrono::steady_clock::now() - start, 3s);
    EXPECT_EQ(Count("card 2"), 0u) << Log();
}

INSTANTIATE_TEST_SUITE_P(Dialects, DialerProgramTest, ::testing::Values("card", "standard"));

TEST(CommanderProgram, ReportsTheModemReadyWhileItsDeviceExists) {
    const testing::TempFolder temp;
    const std::string device = temp / "ttyUSB2";
    std::ofstream(device) << "";
    Background commander(std::string(VQM_COMMANDER) + " --runtime-dir " + temp.Path() +
                         " --device " + device + " >/dev/null");
    const std::string socket = WindowSocketPath(temp.Path(), kCompanionClass);
    ASSERT_TRUE(WaitFor([&] { return ServerAnswers(socket); }));
    EXPECT_EQ(SendWindowMessage(socket, kMsgCardPowerQuery, 0, 0), 1L);
    EXPECT_EQ(SendWindowMessage(socket, kMsgCardPowerUp, 0, 0), 1L);
    fs::remove(device);  // unplugged
    EXPECT_EQ(SendWindowMessage(socket, kMsgCardPowerQuery, 0, 0), 0L);
    EXPECT_EQ(SendWindowMessage(socket, kMsgCardPowerUp, 0, 0), 0L);
    EXPECT_EQ(RunShell(std::string(VQM_COMMANDER) + " --runtime-dir " + temp.Path()).second, 1);
    EXPECT_EQ(commander.Stop(), 0);
    EXPECT_FALSE(ServerAnswers(socket));
}

}  // namespace
}  // namespace vqm
