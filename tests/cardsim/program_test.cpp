// vqm-cardsim run as a user runs it: a separate process, its sockets, its control client.
#include <fcntl.h>
#include <poll.h>
#include <termios.h>
#include <unistd.h>

#include <gtest/gtest.h>

#include <chrono>
#include <filesystem>
#include <fstream>

#include "cardsim/card_sim.h"
#include "link/link.h"
#include "support/local_socket.h"
#include "support/settings_store.h"
#include "tests/common/process.h"
#include "tests/common/temp_folder.h"

namespace vqm::cardsim {
namespace {

namespace fs = std::filesystem;
using namespace std::chrono_literals;
using vqm::testing::RunShell;
using vqm::testing::WaitFor;

class ProgramTest : public ::testing::Test {
  protected:
    void Start(const std::string& extra = "") {
        card_.Start(std::string(VQM_CARDSIM) + " --baud 0 --power-up-ms 300" + " --runtime-dir " +
                    run_ + " --state-dir " + (temp_ / "state") + " " + extra + " >/dev/null");
        ASSERT_TRUE(WaitFor([&] { return ServerAnswers(ControlPath()); }));
    }
    int Stop() { return card_.Stop(); }
    std::string ControlPath() const { return run_ + "/cardsim.ctl"; }
    std::string CompanionPath() const { return WindowSocketPath(run_, kCompanionClass); }
    std::pair<std::string, int> Ctl(const std::string& command) {
        return RunShell(std::string(VQM_CARDSIM) + " --runtime-dir " + run_ + " ctl " + command);
    }

    const vqm::testing::TempFolder temp_;
    const std::string run_ = temp_ / "run";
    vqm::testing::Background card_;
};

TEST_F(ProgramTest, HelpAndBadOptions) {
    auto [help, status] = RunShell(std::string(VQM_CARDSIM) + " --help");
    EXPECT_EQ(status, 0);
    EXPECT_NE(help.find("--power-up-ms"), std::string::npos);
    EXPECT_NE(help.find("remote-hangup"), std::string::npos);
    EXPECT_EQ(RunShell(std::string(VQM_CARDSIM) + " --baud fast").second, 2);
    EXPECT_EQ(RunShell(std::string(VQM_CARDSIM) + " --dialect hayes").second, 2);
    EXPECT_NE(help.find("--dialect card|standard"), std::string::npos);
    EXPECT_NE(help.find("inject N TEXT"), std::string::npos);
    EXPECT_EQ(RunShell(std::string(VQM_CARDSIM) + " --script /nonexistent").second, 2);
    auto [noCard, ctlStatus] = Ctl("status");
    EXPECT_EQ(ctlStatus, 2);
    EXPECT_NE(noCard.find("no simulated card is running"), std::string::npos);
}

TEST_F(ProgramTest, TheDialerPowersItUpThroughTheCardManagerAndTalksToIt) {
    Start();
    EXPECT_EQ(SendWindowMessage(CompanionPath(), kMsgCardPowerQuery, 0, 0), 0L);
    EXPECT_EQ(SendWindowMessage(CompanionPath(), kMsgCardPowerUp, 0, 0), 1L);
    EXPECT_EQ(SendWindowMessage(CompanionPath(), kMsgCardPowerQuery, 0, 0), 2L);
    ASSERT_TRUE(WaitFor(
        [&] { return SendWindowMessage(CompanionPath(), kMsgCardPowerQuery, 0, 0) == 1L; }));

    SettingsStore settings(temp_ / "settings.db");
    SetSettingString(settings, u"PnpId", u"TAVRO_CARD_PHONE");
    Link link(settings, DriverRoots{run_, temp_ / "no-tty"});
    ASSERT_EQ(PortOpen(link), 1);
    EXPECT_FLOAT_EQ(link.firmwareVersion, 4.0f);

    EXPECT_EQ(Ctl("signal 30").second, 0);
    EXPECT_EQ(Ctl("signal 300"), std::make_pair(std::string("ERROR: signal needs a quality from "
                                                            "0 to 31, or 99\n"),
                                                1));
    int bars = -1;
    ASSERT_TRUE(WaitFor([&] { return (bars = GetSignalBars(link)) != -1; }));
    EXPECT_EQ(bars, 3);

    // Pulled: the transaction fails at once and the manager reports the card powered down.
    EXPECT_EQ(Ctl("pull").second, 0);
    char reply[64];
    EXPECT_EQ(AtCommand(link, "AT\r", reply, sizeof reply), 0u);
    EXPECT_EQ(SendWindowMessage(CompanionPath(), kMsgCardPowerQuery, 0, 0), 0L);
    PortClose(link);

    EXPECT_EQ(Stop(), 0);
    EXPECT_FALSE(fs::exists(ControlPath()));
    EXPECT_FALSE(fs::exists(CompanionPath()));
    EXPECT_FALSE(fs::exists(run_ + "/Drivers/Active/vqm-cardsim"));
}

// The standard personality on its pseudo-terminal, spoken to byte by byte as a raw client would,
// with an unsolicited line injected between the lines of a reply.
TEST_F(ProgramTest, TheStandardPersonalityOnTheLine) {
    Start("--powered --dialect standard");
    std::string status = Ctl("status").first;
    ASSERT_NE(status.find("dialect=standard"), std::string::npos) << status;
    const size_t deviceAt = status.find("device=") + 7;
    const std::string device = status.substr(deviceAt, status.find(' ', deviceAt) - deviceAt);
    const int fd = open(device.c_str(), O_RDWR | O_NOCTTY | O_CLOEXEC);
    ASSERT_GE(fd, 0) << device;
    termios raw{};
    tcgetattr(fd, &raw);
    cfmakeraw(&raw);
    tcsetattr(fd, TCSANOW, &raw);
    // Everything up to and including the final "OK" line, within two seconds.
    auto exchange = [&](const std::string& command) {
        EXPECT_EQ(write(fd, command.data(), command.size()), static_cast<ssize_t>(command.size()));
        std::string got;
        const auto until = std::chrono::steady_clock::now() + 2s;
        while (got.find("\r\nOK\r\n") == std::string::npos &&
               std::chrono::steady_clock::now() < until) {
            pollfd p{fd, POLLIN, 0};
            char buffer[256];
            if (poll(&p, 1, 50) > 0) {
                const ssize_t n = read(fd, buffer, sizeof buffer);
                if (n > 0) got.append(buffer, static_cast<size_t>(n));
            }
        }
        return got;
    };
    EXPECT_EQ(exchange("ATE1\r"), "\r\nOK\r\n");
    EXPECT_EQ(exchange("AT+GMR\r"), "\r\nREV1\r\n\r\nOK\r\n");
    // Byte 14: inside the reply's operator line, so it follows that line.
    EXPECT_EQ(Ctl("inject 14 ^RSSI: 4").second, 0);
    EXPECT_EQ(exchange("AT+COPS?\r"), "\r\n+COPS: 0,0,\"COSMOTE\"\r\n\r\n^RSSI: 4\r\n\r\nOK\r\n");
    EXPECT_EQ(Ctl("inject x ^RSSI: 4").second, 1);
    close(fd);
    EXPECT_EQ(Stop(), 0);
}

TEST_F(ProgramTest, ScriptsRunAtStartAndStateOutlivesTheRun) {
    std::ofstream(temp_ / "script") << "# the demo network\nbusy 0800\nwait 50\noperator 23410\n";
    Start("--powered --firmware SW3.80 --script " + (temp_ / "script"));
    EXPECT_TRUE(fs::exists(run_ + "/Drivers/Active/vqm-cardsim/Name"));
    std::string status;
    ASSERT_TRUE(WaitFor([&] {
        return (status = Ctl("status").first).find("23410") != std::string::npos;
    })) << status;
    EXPECT_NE(status.find("powered=1"), std::string::npos);
    EXPECT_NE(status.find("firmware=SW3.80"), std::string::npos);

    // A second card cannot take the same sockets.
    EXPECT_EQ(RunShell(std::string(VQM_CARDSIM) + " --runtime-dir " + run_).second, 1);
    EXPECT_EQ(Stop(), 0);

    Start();
    status = Ctl("status").first;
    EXPECT_NE(status.find("powered=0"), std::string::npos) << status;
    EXPECT_NE(status.find("operator=23410 firmware=SW3.80"), std::string::npos) << status;
}

}  // namespace
}  // namespace vqm::cardsim
