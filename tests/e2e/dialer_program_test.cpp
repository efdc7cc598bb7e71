// The dialer and the simulated card as two programs, started as a user starts them, each
// with its own sockets in a private runtime folder. What the dialer shows is read from its
// --ui-log record; its boxes are answered by --answer-boxes.
#include <gtest/gtest.h>
#include <sys/stat.h>

#include <chrono>
#include <filesystem>
#include <fstream>
#include <sstream>

#include "support/local_socket.h"
#include "support/settings_store.h"
#include "tests/common/process.h"
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

class DialerProgramTest : public ::testing::Test {
  protected:
    DialerProgramTest() {
        fs::create_directories(run_);
        chmod(run_.c_str(), 0700);
        SettingsStore settings(temp_ / "settings.db");
        SetSettingString(settings, u"PnpId", u"TAVRO_CARD_PHONE");
    }

    // The variables a user's session gives both programs, pointed into the test's folder.
    std::string Environment() const {
        return "env XDG_RUNTIME_DIR=" + temp_.Path() +
               "/xdg VQM_SETTINGS_DB=" + (temp_ / "settings.db") +
               " XDG_DATA_HOME=" + (temp_ / "data") +
               " QT_QPA_PLATFORM=offscreen DBUS_SESSION_BUS_ADDRESS=unix:path=/nonexistent ";
    }
    void StartCard(const std::string& options = "") {
        card_.Start(Environment() + VQM_CARDSIM + " --power-up-ms 500 --state-dir " +
                    (temp_ / "state") + " " + options + " >" + (temp_ / "cardsim.out") + " 2>&1");
        ASSERT_TRUE(
            WaitFor([&] { return ServerAnswers(WindowSocketPath(run_, kCompanionClass)); }));
    }
    void StartDialer(const std::string& answer) {
        dialer_.Start(Environment() + VQM_DIALER + " --ui-log " + (temp_ / "ui.log") +
                      " --answer-boxes " + answer + " >" + (temp_ / "dialer.out") + " 2>&1");
        ASSERT_TRUE(WaitFor([&] { return ServerAnswers(DialerSocket()); }, 10s))
            << Read(temp_ / "dialer.out");
    }
    std::string DialerSocket() const { return WindowSocketPath(run_, "DIALERAPP_CLASS"); }
    static std::string Read(const std::string& path) {
        std::ifstream file(path);
        std::ostringstream text;
        text << file.rdbuf();
        return text.str();
    }
    std::string Log() const { return Read(temp_ / "ui.log"); }
    bool LogShows(const std::string& text, std::chrono::milliseconds limit = 20s) {
        return WaitFor([&] { return Log().find(text) != std::string::npos; }, limit);
    }
    size_t Count(const std::string& text) const {
        const std::string log = Log();
        size_t count = 0;
        for (size_t at = log.find(text); at != std::string::npos; at = log.find(text, at + 1))
            ++count;
        return count;
    }
    std::pair<std::string, int> Ctl(const std::string& command) {
        return RunShell(Environment() + VQM_CARDSIM + " ctl " + command);
    }

    const testing::TempFolder temp_;
    const std::string run_ = temp_ / "xdg/VQMFull";
    Background card_;
    Background dialer_;
};

TEST_F(DialerProgramTest, PowerUpAnsweredOkConnectsAndTheDialerEndsCleanly) {
    StartCard();
    StartDialer("ok");
    ASSERT_TRUE(LogShows(std::string(kPowerUpQuestion) + " -> OK")) << Log();
    ASSERT_TRUE(LogShows("status Initializing...")) << Log();
    ASSERT_TRUE(LogShows("card 2 connected")) << Log();
    EXPECT_LT(Log().find("window shown"), Log().find("card 2 connected"));

    // About reads the firmware from the card.
    EXPECT_EQ(SendWindowMessage(DialerSocket(), 273, 40018, 0), 0L);
    EXPECT_TRUE(LogShows("dialog About: Tavro Card Phone 2.0 Firmware Version 4.00")) << Log();

    // A second start brings the first forward and goes away.
    auto [output, status] = RunShell(Environment() + VQM_DIALER);
    EXPECT_EQ(status, 0) << output;
    EXPECT_TRUE(LogShows("foreground")) << Log();

    // Exit from the File menu: the dialer ends by itself, leaving nothing running and
    // nothing answering for it.
    SendWindowMessage(DialerSocket(), 273, 40016, 0, 2000);
    EXPECT_EQ(dialer_.WaitExit(10s), 0) << Read(temp_ / "dialer.out");
    EXPECT_FALSE(ServerAnswers(DialerSocket()));
    EXPECT_EQ(Ctl("status").first.find("call=none") != std::string::npos, true);
}

TEST_F(DialerProgramTest, PullingTheCardDropsTheConnectionAndAStopSignalEndsTheDialer) {
    StartCard("--powered");
    StartDialer("ok");
    ASSERT_TRUE(LogShows("card 2 connected")) << Log();
    EXPECT_EQ(Count("box "), 0u);  // a powered card is not asked about

    EXPECT_EQ(Ctl("pull").second, 0);
    ASSERT_TRUE(LogShows("card 1 not connected")) << Log();
    ASSERT_TRUE(LogShows("status No Card Phone inserted.")) << Log();

    // Ctrl-C, or a stop from the session, ends it as Exit does.
    kill(dialer_.Pid(), SIGTERM);
    EXPECT_EQ(dialer_.WaitExit(10s), 0) << Read(temp_ / "dialer.out");
}

TEST_F(DialerProgramTest, DecliningThePowerUpAsksOnceAndSaysTheCardIsAbsentOnce) {
    StartCard();
    StartDialer("cancel");
    ASSERT_TRUE(LogShows(std::string(kPowerUpQuestion) + " -> Cancel")) << Log();
    ASSERT_TRUE(LogShows("status No Card Phone inserted.")) << Log();
    // Three more passes of the once-a-second watch change nothing.
    std::this_thread::sleep_for(3s);
    EXPECT_EQ(Count("box "), 1u) << Log();
    EXPECT_EQ(Count("status "), 1u) << Log();
    EXPECT_EQ(Count("card 2"), 0u) << Log();
}

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
