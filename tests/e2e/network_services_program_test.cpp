// The Call Forward, Call Barring and Security pages in the real program on the simulated card,
// both personalities: taps on their controls over the dialer's socket, dialogs filled from a
// --dialog-fields file, and the results read from the dialer's --ui-log record and from the
// card's own record of its state.
#include <gtest/gtest.h>
#include <sys/stat.h>

#include <chrono>
#include <filesystem>
#include <fstream>
#include <functional>
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

constexpr int kShowSettings = 40005, kExit = 40016;
constexpr int kPageForward = 1113, kPageBarring = 1114, kPageSecurity = 1115;
constexpr int kBusyRowButton = 1073, kForwardRequest = 1076;
constexpr int kBarInternational = 1090, kBarAllOutgoing = 1092;
constexpr int kPinRequestOn = 1082, kPinRequestOff = 1083, kRequestStatus = 1084,
              kChangeCode = 1085;

class NetworkServicesProgramTest : public ::testing::TestWithParam<const char*> {
  protected:
    NetworkServicesProgramTest() {
        fs::create_directories(run_);
        chmod(run_.c_str(), 0700);
        SettingsStore settings(temp_ / "settings.db");
        SetSettingString(settings, u"PnpId", u"TAVRO_CARD_PHONE");
    }
    ~NetworkServicesProgramTest() override {
        if (ServerAnswers(DialerSocket())) SendWindowMessage(DialerSocket(), 273, kExit, 0, 2000);
        dialer_.WaitExit(10s);
    }

    std::string Environment() const {
        return "env XDG_RUNTIME_DIR=" + temp_.Path() +
               "/xdg VQM_SETTINGS_DB=" + (temp_ / "settings.db") +
               " XDG_DATA_HOME=" + (temp_ / "data") + " XDG_CONFIG_HOME=" + (temp_ / "config") +
               " QT_QPA_PLATFORM=offscreen DBUS_SESSION_BUS_ADDRESS=unix:path=/nonexistent ";
    }
    void Start() {
        card_.Start(Environment() + VQM_CARDSIM + " --dialect " + GetParam() +
                    " --powered --state-dir " + (temp_ / "state") + " >" + (temp_ / "cardsim.out") +
                    " 2>&1");
        ASSERT_TRUE(
            WaitFor([&] { return ServerAnswers(WindowSocketPath(run_, kCompanionClass)); }));
        dialer_.Start(Environment() + VQM_DIALER + " --ui-log " + (temp_ / "ui.log") +
                      " --answer-boxes ok --dialog-fields " + Fields() + " >" +
                      (temp_ / "dialer.out") + " 2>&1");
        ASSERT_TRUE(WaitFor([&] { return ServerAnswers(DialerSocket()); }, 10s));
        // The Network page reads the operator once the card's state has reached every page, so
        // the Settings view is usable from then on.
        ASSERT_TRUE(Shows("settings-network operator")) << Log();
        Tap(kShowSettings);
    }
    std::string DialerSocket() const { return WindowSocketPath(run_, "DIALERAPP_CLASS"); }
    std::string Fields() const { return temp_ / "fields"; }
    static std::string Read(const std::string& path) {
        std::ifstream file(path, std::ios::binary);
        std::ostringstream text;
        text << file.rdbuf();
        return text.str();
    }
    std::string Log() const { return Read(temp_ / "ui.log"); }
    static int Count(const std::string& text, const std::string& what) {
        int n = 0;
        for (size_t at = text.find(what); at != std::string::npos; at = text.find(what, at + 1))
            ++n;
        return n;
    }
    // The log shows text at least times times.
    bool Shows(const std::string& text, int times = 1) {
        return WaitFor([&] { return Count(Log(), text) >= times; }, 20s);
    }
    bool CardKeeps(const std::string& line) {
        return WaitFor(
            [&] { return Read(temp_ / "state/card.state").find(line) != std::string::npos; }, 20s);
    }
    void Tap(int id) { SendWindowMessage(DialerSocket(), 273, id, 0, 2000); }
    // Taps until shown() holds. The window is greyed while a page waits for the card (as a
    // person would find it), so a tap that comes then is not taken and is made again.
    bool TapUntil(int id, const std::function<bool()>& shown) {
        for (int attempt = 0; attempt < 10; ++attempt) {
            Tap(id);
            if (WaitFor(shown, 2s)) return true;
        }
        return false;
    }
    // The next dialog's answer, then the tap that opens it; true once the dialog took it.
    bool TapWithDialog(int id, const std::string& fields) {
        std::ofstream(Fields()) << fields << "\n";
        return TapUntil(id, [&] { return !fs::exists(Fields()); });
    }

    const testing::TempFolder temp_;
    const std::string run_ = temp_ / "xdg/VQMFull";
    Background card_;
    Background dialer_;
};

INSTANTIATE_TEST_SUITE_P(Dialects, NetworkServicesProgramTest,
                         ::testing::Values("card", "standard"));

TEST_P(NetworkServicesProgramTest, BusyVoiceCallsForwardedAndRequestShowsIt) {
    Start();
    Tap(kPageForward);
    ASSERT_TRUE(TapWithDialog(kBusyRowButton, "FORWARD_REQUEST_DIALOG 1153 1149=+441234567890"))
        << Log();
    EXPECT_TRUE(CardKeeps("net-forward 1 1 +441234567890 145 20 1\n"))
        << Read(temp_ / "state/card.state");
    ASSERT_TRUE(TapUntil(kForwardRequest, [&] {
        return Count(Log(), "settings-forward Voice All Calls:") > 0;
    })) << Log();
    EXPECT_TRUE(Shows("settings-forward Voice If Busy: +441234567890")) << Log();
    EXPECT_TRUE(Shows("settings-forward Voice All Calls: NOT ACTIVE")) << Log();
}

TEST_P(NetworkServicesProgramTest, InternationalCallsBarredWithTheRightPasswordOnly) {
    Start();
    Tap(kPageBarring);
    ASSERT_TRUE(TapWithDialog(kBarInternational, "ENTER_ACCESS_CODE_DIALOG 1171=0000"));
    EXPECT_TRUE(CardKeeps("net-barring OI 1\n")) << Read(temp_ / "state/card.state");
    EXPECT_TRUE(Shows("settings-barring Voice International barred")) << Log();
    ASSERT_TRUE(TapWithDialog(kBarAllOutgoing, "ENTER_ACCESS_CODE_DIALOG 1171=1111"));
    EXPECT_TRUE(
        Shows("box VQM Dialer: Activation Error! / Please check your password. / "
              "incorrect password -> OK"))
        << Log();
    EXPECT_TRUE(CardKeeps("net-barring AO 0\n"));
}

TEST_P(NetworkServicesProgramTest, PinRequestOnPinChangedThenThreeWrongPinsBlockTheSim) {
    Start();
    Tap(kPageSecurity);
    ASSERT_TRUE(TapWithDialog(kPinRequestOn, "PIN_CODE_REQUEST_DIALOG 1172=1234"));
    ASSERT_TRUE(Shows("settings-security pin-request on")) << Log();
    ASSERT_TRUE(
        TapWithDialog(kChangeCode, "CHANGE_ACCESS_CODE_DIALOG 1174=1234 1175=4321 1176=4321"));
    EXPECT_TRUE(CardKeeps("net-password SC 4321\n")) << Read(temp_ / "state/card.state");

    const std::string failed = "box VQM Dialer: Cannot change PIN Lock status! / ";
    for (int attempt = 1; attempt <= 3; ++attempt) {
        ASSERT_TRUE(TapWithDialog(kPinRequestOff, "PIN_CODE_REQUEST_DIALOG 1172=0000"));
        ASSERT_TRUE(Shows(failed, attempt)) << Log();
    }
    EXPECT_EQ(Count(Log(), failed + "incorrect password"), 2) << Log();
    EXPECT_EQ(Count(Log(), failed + "SIM PUK required"), 1) << Log();
    ASSERT_TRUE(TapUntil(kRequestStatus, [&] {
        return Count(Log(), "box VQM Dialer: Request error / SIM PUK required -> OK") > 0;
    })) << Log();
    EXPECT_TRUE(Shows("settings-security pin-request unknown")) << Log();
    EXPECT_TRUE(CardKeeps("net-tries 0 3\n"));
}

}  // namespace
}  // namespace vqm
