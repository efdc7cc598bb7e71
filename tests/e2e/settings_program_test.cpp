// The Settings view in the real program on the simulated card, both personalities: the pages
// driven through the dialer's socket as taps on their controls, the results read from what the
// card reports afterwards, from the dialer's --ui-log record and from the files the Modem page
// writes for the modem driver and wvdial.
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

// Command ids of the window and of the Settings view's pages.
constexpr int kShowSettings = 40005, kExit = 40016;
constexpr int kPageMessages = 1111, kPageNetwork = 1112, kPageModem = 1116;
constexpr int kRowFirst = 1300;
constexpr int kCentreDelete = 1103, kCentreSelect = 1104;
constexpr int kManual = 1062, kSearch = 1064, kRegister = 1065;
constexpr int kIsdnV120 = 1053;

class SettingsProgramTest : public ::testing::TestWithParam<const char*> {
  protected:
    SettingsProgramTest() {
        fs::create_directories(run_);
        chmod(run_.c_str(), 0700);
        SettingsStore settings(temp_ / "settings.db");
        SetSettingString(settings, u"PnpId", u"TAVRO_CARD_PHONE");
        // Two centres, the first chosen: the card learns it as soon as it connects.
        const int32_t two = 2, first = 0, off = 0;
        SetSettingInt(settings, u"SettingsMessagesCenters", &two);
        SetSettingInt(settings, u"SettingsMessagesChosenCenter", &first);
        SetSettingInt(settings, u"SettingsMessagesUseSIMDefault", &off);
        SetSettingString(settings, u"SettingsSMSC_Name0", u"Home");
        SetSettingString(settings, u"SettingsSMSC_Number0", u"+306900000");
        SetSettingString(settings, u"SettingsSMSC_Validity0", u"24 hours");
        SetSettingString(settings, u"SettingsSMSC_Name1", u"Office");
        SetSettingString(settings, u"SettingsSMSC_Number1", u"+441234567");
        SetSettingString(settings, u"SettingsSMSC_Validity1", u"Maximum time");
    }
    ~SettingsProgramTest() override {
        if (ServerAnswers(DialerSocket())) SendWindowMessage(DialerSocket(), 273, kExit, 0, 2000);
        dialer_.WaitExit(10s);
    }

    // A user's session pointed into the test's folder; the modem driver's files go there too.
    std::string Environment() const {
        return "env XDG_RUNTIME_DIR=" + temp_.Path() +
               "/xdg VQM_SETTINGS_DB=" + (temp_ / "settings.db") +
               " XDG_DATA_HOME=" + (temp_ / "data") + " XDG_CONFIG_HOME=" + (temp_ / "config") +
               " VQM_WVDIAL_CONF=" + (temp_ / "wvdialrc") +
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
        ASSERT_TRUE(WaitFor([&] { return ServerAnswers(DialerSocket()); }, 10s));
        ASSERT_TRUE(Shows("card 2 connected")) << Log();
        // The Settings view has heard of the connection (its Network page asked the card).
        ASSERT_TRUE(Shows("settings-network operator COSMOTE automatic")) << Log();
    }
    std::string DialerSocket() const { return WindowSocketPath(run_, "DIALERAPP_CLASS"); }
    static std::string Read(const std::string& path) {
        std::ifstream file(path, std::ios::binary);
        std::ostringstream text;
        text << file.rdbuf();
        return text.str();
    }
    std::string Log() const { return Read(temp_ / "ui.log"); }
    bool Shows(const std::string& text) {
        return WaitFor([&] { return Log().find(text) != std::string::npos; }, 20s);
    }
    // The card's own record of itself: what it would answer to "+CSCA?" is kept there.
    bool CardKeeps(const std::string& line) {
        return WaitFor(
            [&] { return Read(temp_ / "state/card.state").find(line) != std::string::npos; }, 20s);
    }
    bool CardStatusHas(const std::string& text) {
        return WaitFor(
            [&] {
                return RunShell(Environment() + VQM_CARDSIM + " ctl status").first.find(text) !=
                       std::string::npos;
            },
            20s);
    }
    void Tap(int id) { SendWindowMessage(DialerSocket(), 273, id, 0, 2000); }

    const testing::TempFolder temp_;
    const std::string run_ = temp_ / "xdg/VQMFull";
    Background card_;
    Background dialer_;
};

INSTANTIATE_TEST_SUITE_P(Dialects, SettingsProgramTest, ::testing::Values("card", "standard"));

TEST_P(SettingsProgramTest, NetworkSearchAndRegisterReachTheCard) {
    Start();
    ASSERT_EQ(
        RunShell(Environment() + VQM_CARDSIM + " ctl networks 20201:2,20205:1,20210:1").second, 0);
    Tap(kShowSettings);
    Tap(kPageNetwork);
    Tap(kManual);
    Tap(kSearch);
    ASSERT_TRUE(Shows("settings-network found COSMOTE; PANAFON; TELESTET;")) << Log();
    Tap(kRowFirst + 1);
    Tap(kRegister);
    EXPECT_TRUE(Shows("box VQM Dialer: Network Registration Success. -> OK")) << Log();
    EXPECT_TRUE(CardStatusHas("operator=20205"));
}

TEST_P(SettingsProgramTest, ChosenCentreReachesTheCardOnConnectAndOnSelectAndGoesOnDelete) {
    Start();
    ASSERT_TRUE(Shows("settings-centre chosen +306900000")) << Log();
    EXPECT_TRUE(CardKeeps("sms-centre +306900000\n")) << Read(temp_ / "state/card.state");
    EXPECT_TRUE(CardKeeps("sms-params 23 ")) << Read(temp_ / "state/card.state");
    Tap(kShowSettings);
    Tap(kPageMessages);
    Tap(kRowFirst + 1);
    Tap(kCentreSelect);
    EXPECT_TRUE(Shows("settings-centre chosen +441234567")) << Log();
    EXPECT_TRUE(CardKeeps("sms-centre +441234567\n")) << Read(temp_ / "state/card.state");
    EXPECT_TRUE(CardKeeps("sms-params 255 ")) << Read(temp_ / "state/card.state");
    // Deleting the centre in use gives the card the SIM's own centre again.
    Tap(kCentreDelete);
    EXPECT_TRUE(Shows("settings-centre sim default")) << Log();
    EXPECT_TRUE(CardKeeps("sms-centre +3097100000\n")) << Read(temp_ / "state/card.state");
    EXPECT_TRUE(CardKeeps("sms-params 167 ")) << Read(temp_ / "state/card.state");
}

TEST_P(SettingsProgramTest, ModemPageWritesTheInitCommandForWvdialAndTheDriver) {
    Start();
    Tap(kShowSettings);
    Tap(kPageModem);
    Tap(kIsdnV120);
    Tap(kRowFirst + 2);  // 19.2 kbits/s
    const std::string command = "AT+CBST=51,0,1;+CHSN=3,0,0,0";
    EXPECT_TRUE(WaitFor(
        [&] {
            return Read(temp_ / "wvdialrc").find("[Dialer VQMFull]\nInit3 = " + command + "\n") !=
                   std::string::npos;
        },
        10s))
        << Read(temp_ / "wvdialrc");
    EXPECT_EQ(Read(temp_ / ("config/VQMFull/registry/Drivers/PCMCIA/"
                            "Tavro_Mobile_Phones-TAVRO_CARD_PHONE-4C2D/Init/3")),
              command + "<cr>");
    SettingsStore settings(temp_ / "settings.db");
    char16_t stored[64] = u"";
    ASSERT_EQ(GetSettingString(settings, u"ATModemCmd", stored, 64), 1);
    EXPECT_EQ(std::u16string(stored), u"AT+CBST=51,0,1;+CHSN=3,0,0,0");
}

}  // namespace
}  // namespace vqm
