// Call waiting through the real programs: vqm-dialer on vqm-cardsim in either dialect. A second
// caller during a call shows on the DialPad while the call goes on, read from the dialer's
// --ui-log record; with the network's call waiting off the second caller is turned away.
#include <gtest/gtest.h>
#include <sys/stat.h>

#include <chrono>
#include <filesystem>
#include <fstream>
#include <sstream>
#include <string>

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

constexpr int kCallKey = 1138, kEndKey = 1139;

class CallWaitingProgramTest : public ::testing::TestWithParam<const char*> {
  protected:
    CallWaitingProgramTest() {
        fs::create_directories(run_);
        chmod(run_.c_str(), 0700);
        SettingsStore settings(temp_ / "settings.db");
        SetSettingString(settings, u"PnpId", u"TAVRO_CARD_PHONE");
    }
    std::string Environment() const {
        return "env XDG_RUNTIME_DIR=" + temp_.Path() +
               "/xdg VQM_SETTINGS_DB=" + (temp_ / "settings.db") +
               " XDG_DATA_HOME=" + (temp_ / "data") +
               " QT_QPA_PLATFORM=offscreen DBUS_SESSION_BUS_ADDRESS=unix:path=/nonexistent ";
    }
    void Start() {
        card_.Start(Environment() + VQM_CARDSIM + " --dialect " + GetParam() +
                    " --powered --state-dir " + (temp_ / "state") + " >" + (temp_ / "cardsim.out") +
                    " 2>&1");
        ASSERT_TRUE(
            WaitFor([&] { return ServerAnswers(WindowSocketPath(run_, kCompanionClass)); }));
        dialer_.Start(Environment() + VQM_DIALER + " --ui-log " + (temp_ / "ui.log") +
                      " --answer-boxes ok >" + (temp_ / "dialer.out") + " 2>&1");
        ASSERT_TRUE(LogShows("card 2 connected")) << Log();
    }
    std::string Log() const {
        std::ifstream file(temp_ / "ui.log");
        std::ostringstream text;
        text << file.rdbuf();
        return text.str();
    }
    bool LogShows(const std::string& text, std::chrono::milliseconds limit = 20s) {
        return WaitFor([&] { return Log().find(text) != std::string::npos; }, limit);
    }
    std::string Ctl(const std::string& command) {
        return RunShell(Environment() + VQM_CARDSIM + " ctl " + command).first;
    }
    bool CardShows(const std::string& text) {
        return WaitFor([&] { return Ctl("status").find(text) != std::string::npos; });
    }
    void Key(int id) {
        SendWindowMessage(WindowSocketPath(run_, "DIALERAPP_CLASS"), 273, id, 0, 2000);
    }

    const testing::TempFolder temp_;
    const std::string run_ = temp_ / "xdg/VQMFull";
    Background card_;
    Background dialer_;
};

TEST_P(CallWaitingProgramTest, ASecondCallerShowsOnTheDialPadWhileTheCallGoesOn) {
    Start();
    ASSERT_TRUE(LogShows("status COSMOTE")) << Log();
    for (char c : std::string("0123456"))
        Key(1126 + (c - '0'));
    Key(kCallKey);
    ASSERT_TRUE(CardShows("call=dialing"));
    Ctl("remote-answer");
    ASSERT_TRUE(LogShows("status Voice call")) << Log();

    // Off (a new subscription): turned away, and nothing shows.
    EXPECT_NE(Ctl("ring +447700900999").find("ERROR: a call is in progress"), std::string::npos);

    ASSERT_NE(Ctl("call-waiting on").find("OK"), std::string::npos);
    EXPECT_NE(Ctl("ring +447700900999").find("OK"), std::string::npos);
    ASSERT_TRUE(LogShows("status Waiting: +447700900999")) << Log();
    EXPECT_TRUE(CardShows("call=active number=0123456"));
    EXPECT_EQ(Log().find("status Incoming call"), std::string::npos) << Log();

    // The call ends here; the caller still waiting then rings as a call of its own.
    Key(kEndKey);
    ASSERT_TRUE(LogShows("status Call ended")) << Log();
    ASSERT_TRUE(LogShows("status Incoming call")) << Log();
    ASSERT_TRUE(CardShows("call=incoming number=+447700900999"));
    Key(kEndKey);
    ASSERT_TRUE(LogShows("status Unanswered")) << Log();

    kill(dialer_.Pid(), SIGTERM);
    EXPECT_EQ(dialer_.WaitExit(10s), 0);
}

INSTANTIATE_TEST_SUITE_P(Dialects, CallWaitingProgramTest, ::testing::Values("card", "standard"));

}  // namespace
}  // namespace vqm
