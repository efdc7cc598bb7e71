// The Call Forward, Call Barring and Security pages in the real program on the simulated card,
// both personalities: taps on their controls over the dialer's socket, dialogs filled from a
// --dialog-fields file, and the results read from the dialer's --ui-log record and from the
// card's own record of its state.
#include <gtest/gtest.h>

#include <chrono>
#include <filesystem>
#include <fstream>
#include <functional>
#include <string>

#include "tests/common/program_host.h"

namespace vqm {
namespace {

namespace fs = std::filesystem;
using namespace std::chrono_literals;
using testing::WaitFor;

constexpr int kShowSettings = 40005;
constexpr int kPageForward = 1113, kPageBarring = 1114, kPageSecurity = 1115;
constexpr int kBusyRowButton = 1073, kForwardRequest = 1076;
constexpr int kBarInternational = 1090, kBarAllOutgoing = 1092;
constexpr int kPinRequestOn = 1082, kPinRequestOff = 1083, kRequestStatus = 1084,
              kChangeCode = 1085;

class NetworkServicesProgramTest : public ::testing::TestWithParam<const char*>,
                                   protected testing::ProgramHost {
  protected:
    NetworkServicesProgramTest() : ProgramHost(/*ownConfig=*/true) {}
    ~NetworkServicesProgramTest() override { ExitDialer(); }

    void Start() {
        ASSERT_NO_FATAL_FAILURE(StartCard(std::string("--dialect ") + GetParam() + " --powered"));
        ASSERT_NO_FATAL_FAILURE(StartDialer("--answer-boxes ok --dialog-fields " + Fields()));
        // The Network page reads the operator once the card's state has reached every page, so
        // the Settings view is usable from then on.
        ASSERT_TRUE(Shows("settings-network operator")) << Log();
        Tap(kShowSettings);
    }
    std::string Fields() const { return temp_ / "fields"; }
    // The log shows text at least times times.
    bool Shows(const std::string& text, size_t times = 1) { return LogShows(text, 20s, times); }
    bool CardKeeps(const std::string& line) {
        return WaitFor(
            [&] { return Read(temp_ / "state/card.state").find(line) != std::string::npos; }, 20s);
    }
    void Tap(int id) { Command(id); }
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
};

INSTANTIATE_TEST_SUITE_P(Dialects, NetworkServicesProgramTest,
                         ::testing::Values("card", "standard"));

TEST_P(NetworkServicesProgramTest, BusyVoiceCallsForwardedAndRequestShowsIt) {
    ASSERT_NO_FATAL_FAILURE(Start());
    Tap(kPageForward);
    // "Activate To:" alone leaves the "Unknown" it offers: refused before the card.
    ASSERT_TRUE(TapWithDialog(kBusyRowButton, "FORWARD_REQUEST_DIALOG 1153")) << Log();
    EXPECT_TRUE(
        Shows("box VQM Dialer: \"Unknown\" is not a phone number. / Please enter the "
              "number to forward the calls to. -> OK"))
        << Log();
    EXPECT_EQ(Read(temp_ / "state/card.state").find("net-forward 1 1 "), std::string::npos);
    ASSERT_TRUE(TapWithDialog(kBusyRowButton, "FORWARD_REQUEST_DIALOG 1153 1149=+441234567890"))
        << Log();
    EXPECT_TRUE(CardKeeps("net-forward 1 1 +441234567890 145 20 1\n"))
        << Read(temp_ / "state/card.state");
    ASSERT_TRUE(TapUntil(kForwardRequest, [&] {
        return Count("settings-forward Voice All Calls:") > 0;
    })) << Log();
    EXPECT_TRUE(Shows("settings-forward Voice If Busy: +441234567890")) << Log();
    EXPECT_TRUE(Shows("settings-forward Voice All Calls: NOT ACTIVE")) << Log();
}

TEST_P(NetworkServicesProgramTest, InternationalCallsBarredWithTheRightPasswordOnly) {
    ASSERT_NO_FATAL_FAILURE(Start());
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
    ASSERT_NO_FATAL_FAILURE(Start());
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
    EXPECT_EQ(Count(failed + "incorrect password"), 2u) << Log();
    EXPECT_EQ(Count(failed + "SIM PUK required"), 1u) << Log();
    ASSERT_TRUE(TapUntil(kRequestStatus, [&] {
        return Count("box VQM Dialer: Request error / SIM PUK required -> OK") > 0;
    })) << Log();
    EXPECT_TRUE(Shows("settings-security pin-request unknown")) << Log();
    EXPECT_TRUE(CardKeeps("net-tries 0 3\n"));
}

}  // namespace
}  // namespace vqm
