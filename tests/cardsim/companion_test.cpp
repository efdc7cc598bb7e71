// The card manager's answers, the control commands and the state kept between runs.
#include "cardsim/companion.h"

#include <gtest/gtest.h>

#include <filesystem>
#include <fstream>

#include "support/local_socket.h"
#include "tests/common/temp_folder.h"

namespace vqm::cardsim {
namespace {

using namespace std::chrono_literals;

class CompanionTest : public ::testing::Test {
  protected:
    SimConfig Config() {
        SimConfig config;
        config.baud = 0;
        config.runtimeDir = temp_ / "run";
        config.stateFile = temp_ / "state/card.state";
        return config;
    }
    long Send(unsigned msg) { return companion_.OnMessage(msg, 0, 0, now_); }

    const vqm::testing::TempFolder temp_;
    CardSim card_{Config()};
    Companion companion_{card_, 3000};
    Clock::time_point now_ = Clock::now();
};

TEST_F(CompanionTest, PowerUpTakesItsTimeAndTheQueryFollows) {
    EXPECT_EQ(Send(kMsgCardPowerQuery), 0);
    EXPECT_EQ(Send(kMsgCardPowerUp), 1);
    EXPECT_EQ(Send(kMsgCardPowerQuery), 2);
    EXPECT_EQ(Send(kMsgCardPowerUp), 1);  // asking again does not restart the clock
    now_ += 2999ms;
    EXPECT_EQ(Send(kMsgCardPowerQuery), 2);
    EXPECT_FALSE(card_.Powered());
    now_ += 1ms;
    EXPECT_EQ(Send(kMsgCardPowerQuery), 1);
    EXPECT_TRUE(card_.Powered());
    EXPECT_TRUE(std::filesystem::exists(temp_ / "run/Drivers/Active/vqm-cardsim/PnpId"));

    EXPECT_EQ(Send(kMsgCardPowerDown), 1);
    EXPECT_EQ(Send(kMsgCardPowerQuery), 0);
    EXPECT_FALSE(std::filesystem::exists(temp_ / "run/Drivers/Active/vqm-cardsim"));
    EXPECT_EQ(Send(9999), 0);
}

TEST_F(CompanionTest, APulledCardAnswersPoweredDownAndCannotBePoweredUp) {
    ASSERT_TRUE(card_.PowerUp());
    EXPECT_EQ(Send(kMsgCardPowerQuery), 1);
    EXPECT_EQ(card_.Control("pull"), "OK");
    EXPECT_EQ(Send(kMsgCardPowerQuery), 0);
    EXPECT_EQ(Send(kMsgCardPowerUp), 0);
    EXPECT_EQ(card_.Control("power-up"), "ERROR: no card inserted");

    // Pulled in the middle of a power-up: it never completes.
    EXPECT_EQ(card_.Control("insert"), "OK");
    EXPECT_EQ(Send(kMsgCardPowerQuery), 0);  // back in, still powered down
    EXPECT_EQ(Send(kMsgCardPowerUp), 1);
    card_.Control("pull");
    now_ += 10s;
    companion_.Tick(now_);
    EXPECT_FALSE(card_.Powered());
    EXPECT_EQ(Send(kMsgCardPowerQuery), 0);
}

TEST_F(CompanionTest, SimFullClearedIsAcknowledged) {
    EXPECT_EQ(Send(kMsgSimFullCleared), 1);
    EXPECT_EQ(Send(kMsgSimFullCleared), 1);
    EXPECT_EQ(companion_.SimFullClearedCount(), 2);
}

TEST_F(CompanionTest, KeptStateSurvivesARunAndADamagedLine) {
    EXPECT_EQ(card_.Control("signal 7"), "OK");
    EXPECT_EQ(card_.Control("operator 26201"), "OK");
    EXPECT_EQ(card_.Control("firmware 3.80"), "OK");
    EXPECT_EQ(card_.Control("busy 0123"), "OK");
    EXPECT_EQ(card_.Control("unanswered +4412"), "OK");
    EXPECT_EQ(card_.Control("pull"), "OK");
    {
        CardSim next(Config());
        EXPECT_FALSE(next.Inserted());
        const std::string status = next.Control("status");
        EXPECT_NE(status.find("signal=7 operator=26201 firmware=SW3.80"), std::string::npos)
            << status;
        EXPECT_FALSE(std::filesystem::exists(temp_ / "state/card.state.tmp"));
    }
    std::ofstream(temp_ / "state/card.state", std::ios::app) << "signal\nvolume 99\nbusy";
    CardSim damaged(Config());
    const std::string status = damaged.Control("status");
    EXPECT_NE(status.find("signal=7"), std::string::npos) << status;
    EXPECT_NE(status.find("volume=5"), std::string::npos) << status;  // 99 is no volume
}

TEST_F(CompanionTest, ControlRefusesBadValuesAndReportsStatus) {
    EXPECT_EQ(card_.Control("dance"), "ERROR: unknown command 'dance'");
    EXPECT_EQ(card_.Control("ring"), "ERROR: ring needs a number");
    EXPECT_EQ(card_.Control("signal loud"), "ERROR: signal needs a number");
    EXPECT_EQ(card_.Control("signal 32"), "ERROR: signal needs a quality from 0 to 31, or 99");
    EXPECT_EQ(card_.Control("signal 99"), "OK");
    EXPECT_EQ(card_.Control("operator 7"), "ERROR: operator needs a network code such as 20201");
    EXPECT_EQ(card_.Control("garbage 0"), "ERROR: garbage needs a byte count up to 65536");
    EXPECT_EQ(card_.Control("ring +441234"), "OK");
    EXPECT_EQ(card_.Control("ring +445678"), "ERROR: a call is in progress");
    EXPECT_EQ(
        card_.Control("status").rfind("OK inserted=1 powered=0 call=incoming number=+441234", 0),
        0u)
        << card_.Control("status");
}

TEST_F(CompanionTest, ScriptsRunInOrderWaitAndStopAtTheFirstError) {
    std::vector<int> waits;
    auto wait = [&](int ms) { waits.push_back(ms); };
    EXPECT_EQ(card_.RunScript("# a busy line\n\nbusy 0123\nwait 250\n  signal 3\n", wait), "OK");
    EXPECT_EQ(waits, std::vector<int>{250});
    EXPECT_NE(card_.Control("status").find("signal=3"), std::string::npos);
    EXPECT_EQ(card_.RunScript("signal 4\nwait soon\nsignal 5\n", wait),
              "line 2: ERROR: wait needs milliseconds");
    EXPECT_EQ(card_.RunScript("signal 6\nfly\nsignal 8\n", wait),
              "line 2: ERROR: unknown command 'fly'");
    EXPECT_NE(card_.Control("status").find("signal=6"), std::string::npos);
}

}  // namespace
}  // namespace vqm::cardsim
