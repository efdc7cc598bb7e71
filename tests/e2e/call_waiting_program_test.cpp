// Call waiting through the real programs: vqm-dialer on vqm-cardsim in either dialect. A second
// caller during a call shows on the DialPad while the call goes on, read from the dialer's
// --ui-log record; with the network's call waiting off the second caller is turned away.
#include <gtest/gtest.h>

#include <chrono>
#include <string>

#include "tests/common/program_host.h"

namespace vqm {
namespace {

using namespace std::chrono_literals;
using testing::WaitFor;

constexpr int kCallKey = 1138, kEndKey = 1139;

class CallWaitingProgramTest : public ::testing::TestWithParam<const char*>,
                               protected testing::ProgramHost {
  protected:
    void Start() { StartConnected(std::string("--dialect ") + GetParam() + " --powered"); }
    bool CardShows(const std::string& text) {
        return WaitFor([&] { return Ctl("status").first.find(text) != std::string::npos; });
    }
    void Key(int id) { Command(id); }
};

TEST_P(CallWaitingProgramTest, ASecondCallerShowsOnTheDialPadWhileTheCallGoesOn) {
    ASSERT_NO_FATAL_FAILURE(Start());
    ASSERT_TRUE(LogShows("status COSMOTE")) << Log();
    for (char c : std::string("0123456"))
        Key(1126 + (c - '0'));
    Key(kCallKey);
    ASSERT_TRUE(CardShows("call=dialing"));
    Ctl("remote-answer");
    ASSERT_TRUE(LogShows("status Voice call")) << Log();

    // Off (a new subscription): turned away, and nothing shows.
    EXPECT_NE(Ctl("ring +447700900999").first.find("ERROR: a call is in progress"),
              std::string::npos);

    ASSERT_NE(Ctl("call-waiting on").first.find("OK"), std::string::npos);
    EXPECT_NE(Ctl("ring +447700900999").first.find("OK"), std::string::npos);
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
