// Call waiting below the page: the reply scan on the card's and standard modems' replies, and
// the simulated card's "+CCWA" in both dialects, its kept setting and the second caller it lets
// through during a call.
#include <gtest/gtest.h>

#include <memory>
#include <string>
#include <vector>

#include "cardsim/call_waiting.h"
#include "cardsim/card_engine.h"
#include "cardsim/card_sim.h"
#include "settings/call_waiting_at.h"
#include "tests/common/temp_folder.h"

namespace vqm {
namespace {

using cardsim::CallState;
using cardsim::CardEngine;
using cardsim::Dialect;

TEST(CallWaitingReply, Scan) {
    struct Case {
        const char* reply;
        int expected;
    };
    const Case cases[] = {
        // The card: one line, no class when not active.
        {"\r\n+CCWA: 1,1\r\n\r\nOK\r\n", kWaitingActive},
        {"\r\n+CCWA: 0\r\n\r\nOK\r\n", kWaitingNotActive},
        // Standard modems: a line per active class, the asked classes when none is.
        {"\r\n+CCWA: 0,7\r\n\r\nOK\r\n", kWaitingNotActive},
        {"\r\n+CCWA: 1,2\r\n+CCWA: 1,1\r\n\r\nOK\r\n", kWaitingActive},
        {"\r\n+CCWA: 1,2\r\n+CCWA: 1,4\r\n\r\nOK\r\n", kWaitingNotActive},  // not for voice
        {"\r\n+CCWA: 1\r\n\r\nOK\r\n", kWaitingActive},                     // no class: every class
        {"\r\n+CCWA:1,1\r\nOK\r\n", kWaitingActive},
        {"+CCWA: 1,3\r\nOK\r\n", kWaitingActive},
        // A waiting caller's line inside the reply says nothing about the setting.
        {"\r\n+CCWA: \"4412\",129,1\r\n\r\n+CCWA: 0,1\r\n\r\nOK\r\n", kWaitingNotActive},
        {"\r\n+CCWA: \"4412\",129,1\r\n\r\nOK\r\n", kWaitingUnknown},
        // Refusals and damage.
        {"\r\nERROR\r\n", kWaitingUnknown},
        {"\r\n+CME ERROR: 30\r\n", kWaitingUnknown},
        {"\r\nOK\r\n", kWaitingUnknown},
        {"\r\n+CCWA: 2,1\r\n\r\nOK\r\n", kWaitingUnknown},
        {"\r\n+CCWA: -1,1\r\n", kWaitingUnknown},
        {"\r\n+CCWA: ,1\r\n", kWaitingUnknown},
        {"\r\n+CCWA: 1,x\r\n", kWaitingUnknown},
        // A bare tag does not take the digits of the line after it.
        {"\r\n+CCWA:\r\n1,1\r\nOK\r\n", kWaitingUnknown},
        // A tag inside a line is not a reply line.
        {"\r\nX+CCWA: 1,1\r\nOK\r\n", kWaitingUnknown},
        {"+CCWA: 1,1", kWaitingActive},  // cut after the class
        {"+CCWA: ", kWaitingUnknown},
        {"", kWaitingUnknown},
    };
    for (const Case& c : cases) {
        const std::string reply = c.reply;
        EXPECT_EQ(ParseCallWaitingReply(reply.data(), static_cast<int>(reply.size())), c.expected)
            << reply;
    }
    // The length given ends the reply: the status past it is not read.
    const std::string cut = "\r\n+CCWA: 1,1\r\n";
    EXPECT_EQ(ParseCallWaitingReply(cut.data(), 9), kWaitingUnknown);
    EXPECT_EQ(ParseCallWaitingReply(nullptr, 10), kWaitingUnknown);
}

// One engine per dialect with the call-waiting group, driven command by command.
class CardCallWaitingTest : public ::testing::TestWithParam<Dialect> {
  protected:
    CardCallWaitingTest() : engine_(Config()) {
        auto group = std::make_unique<cardsim::CallWaiting>();
        group_ = group.get();
        engine_.AddCommandSet(std::move(group));
        Exchange("ATE0");
    }
    cardsim::EngineConfig Config() {
        cardsim::EngineConfig config;
        config.dialect = GetParam();
        config.dialDelayMs = 0;
        return config;
    }
    bool Standard() const { return GetParam() == Dialect::Standard; }
    // The reply to one command line, without the card's echo.
    std::string Exchange(const std::string& command) {
        const std::string line = command + "\r";
        engine_.Feed(line.data(), line.size(), now_);
        std::string out = engine_.TakeOutput();
        if (out.rfind(line, 0) == 0) out.erase(0, line.size());
        return out;
    }
    void Connect() {
        Exchange("ATD12345;");
        engine_.Tick(now_);
        engine_.TakeOutput();
        ASSERT_EQ(engine_.State(), CallState::Active);
    }

    cardsim::Clock::time_point now_ = cardsim::Clock::now();
    CardEngine engine_;
    cardsim::CallWaiting* group_ = nullptr;
};

TEST_P(CardCallWaitingTest, QueryEnableAndDisableAnswerAsTheDialectDoes) {
    const std::string notAllowed = Standard() ? "+CME ERROR: 3" : "ERROR";
    struct Step {
        const char* command;
        std::string card, standard;
    };
    const Step steps[] = {
        {"AT+CCWA=1,2,1", "\r\n+CCWA: 0\r\n\r\nOK\r\n", "\r\n+CCWA: 0,1\r\n\r\nOK\r\n"},
        {"AT+CCWA=1,1,1", "\r\nOK\r\n", "\r\nOK\r\n"},
        {"AT+CCWA=1,2,1", "\r\n+CCWA: 1,1\r\n\r\nOK\r\n", "\r\n+CCWA: 1,1\r\n\r\nOK\r\n"},
        // Every class asked: only voice is on.
        {"AT+CCWA=1,2", "\r\n+CCWA: 1,1\r\n\r\nOK\r\n", "\r\n+CCWA: 1,1\r\n\r\nOK\r\n"},
        {"AT+CCWA=1,2,2", "\r\n+CCWA: 0\r\n\r\nOK\r\n", "\r\n+CCWA: 0,2\r\n\r\nOK\r\n"},
        {"AT+CCWA?", "\r\n+CCWA: 1\r\n\r\nOK\r\n", "\r\n+CCWA: 1\r\n\r\nOK\r\n"},
        {"AT+CCWA=1,0,1", "\r\nOK\r\n", "\r\nOK\r\n"},
        {"AT+CCWA=1,2,1", "\r\n+CCWA: 0\r\n\r\nOK\r\n", "\r\n+CCWA: 0,1\r\n\r\nOK\r\n"},
        // Out of range: mode, presentation, a class with no call bit, a quoted field.
        {"AT+CCWA=1,3,1", "\r\n" + notAllowed + "\r\n", "\r\n" + notAllowed + "\r\n"},
        {"AT+CCWA=2,2,1", "\r\n" + notAllowed + "\r\n", "\r\n" + notAllowed + "\r\n"},
        {"AT+CCWA=1,1,8", "\r\n" + notAllowed + "\r\n", "\r\n" + notAllowed + "\r\n"},
        {"AT+CCWA=\"1\",2,1", "\r\n" + notAllowed + "\r\n", "\r\n" + notAllowed + "\r\n"},
    };
    for (const Step& step : steps)
        EXPECT_EQ(Exchange(step.command), Standard() ? step.standard : step.card) << step.command;
    EXPECT_EQ(group_->Classes(), 0);
    // Without the service on the subscription every request is refused and changes nothing.
    EXPECT_EQ(group_->Control("call-waiting", "none"), "OK");
    for (const char* command : {"AT+CCWA=1,2,1", "AT+CCWA=1,1,1"})
        EXPECT_EQ(Exchange(command), "\r\n" + notAllowed + "\r\n") << command;
    EXPECT_EQ(group_->Classes(), 0);
}

TEST_P(CardCallWaitingTest, ASecondCallerWaitsOnlyWhileWaitingIsOnAndAnnouncedAsTheDialectSays) {
    // Off: the second caller is not this group's, and the call goes on alone.
    Connect();
    EXPECT_EQ(group_->Control("ring", "4412"), "");
    EXPECT_EQ(engine_.WaitingNumber(), "");

    EXPECT_EQ(Exchange("AT+CCWA=0,1,1"), "\r\nOK\r\n");
    EXPECT_EQ(group_->Control("ring", "4412"), "OK");
    EXPECT_EQ(engine_.WaitingNumber(), "4412");
    EXPECT_EQ(engine_.State(), CallState::Active);
    // A standard modem told "+CCWA=0" keeps the waiting caller to itself.
    EXPECT_EQ(engine_.TakeOutput().find("+CCWA:") != std::string::npos, !Standard());
    EXPECT_EQ(group_->Control("ring", "4499"), "ERROR: a caller is waiting already");

    // The caller gives up; the next one is announced, with the number as caller ids are.
    engine_.CallerHangUp();
    EXPECT_EQ(engine_.WaitingNumber(), "");
    EXPECT_EQ(Exchange("AT+CCWA=1"), "\r\nOK\r\n");
    EXPECT_EQ(group_->Control("ring", "+445566"), "OK");
    EXPECT_EQ(engine_.TakeOutput(),
              Standard() ? "\r\n+CCWA: \"445566\",145,1\r\n" : "\r\n+CCWA: \"+445566\",145,1\r\n");
    EXPECT_EQ(engine_.State(), CallState::Active);
    EXPECT_EQ(engine_.CallNumber(), "12345");

    // The call ends: the waiting caller rings as a new call.
    EXPECT_NE(Exchange("ATH").find("OK"), std::string::npos);
    engine_.Tick(now_);
    EXPECT_EQ(engine_.State(), CallState::Incoming);
    EXPECT_EQ(engine_.CallNumber(), "+445566");
}

TEST_P(CardCallWaitingTest, AWaitingCallerGivesUpAfterTheRingTimeOut) {
    Connect();
    ASSERT_TRUE(engine_.RingWaiting("4412", true, now_));
    engine_.Tick(now_ + std::chrono::milliseconds(engine_.Config().ringTimeoutMs));
    EXPECT_EQ(engine_.WaitingNumber(), "");
    Exchange("ATH");
    engine_.Tick(now_ + std::chrono::milliseconds(engine_.Config().ringTimeoutMs + 1));
    EXPECT_EQ(engine_.State(), CallState::None);
}

INSTANTIATE_TEST_SUITE_P(Dialects, CardCallWaitingTest,
                         ::testing::Values(Dialect::Card, Dialect::Standard), [](const auto& info) {
                             return info.param == Dialect::Card ? "Card" : "Standard";
                         });

TEST(CardSimCallWaiting, TheSettingIsKeptAndARingDuringACallWaitsOnlyWhenItIsOn) {
    testing::TempFolder temp;
    cardsim::SimConfig config;
    config.baud = 0;
    config.stateFile = temp / "card.state";
    config.engine.dialDelayMs = 0;
    {
        cardsim::CardSim card(config);
        EXPECT_EQ(card.Control("call-waiting"), "OK off");
        EXPECT_EQ(card.Control("call-waiting maybe"), "ERROR: call-waiting takes on, off or none");
        EXPECT_EQ(card.Control("ring +441234"), "OK");
        EXPECT_EQ(card.Control("local-answer"), "OK");
        EXPECT_EQ(card.Control("ring +445678"), "ERROR: a call is in progress");
        EXPECT_EQ(card.Control("call-waiting on"), "OK");
        EXPECT_EQ(card.Control("ring +445678"), "OK");
        EXPECT_NE(card.Control("status").find("call=active number=+441234"), std::string::npos);
    }
    cardsim::CardSim again(config);
    EXPECT_EQ(again.Control("call-waiting"), "OK on");
    // Outside a call a ring is an ordinary ring whatever the setting.
    EXPECT_EQ(again.Control("ring +445678"), "OK");
    EXPECT_NE(again.Control("status").find("call=incoming"), std::string::npos);
    // Taken off the subscription, the service stays off across a restart.
    EXPECT_EQ(again.Control("call-waiting none"), "OK");
    cardsim::CardSim third(config);
    EXPECT_EQ(third.Control("call-waiting"), "OK none");
}

}  // namespace
}  // namespace vqm
