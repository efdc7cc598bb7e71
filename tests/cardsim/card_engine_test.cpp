#include "cardsim/card_engine.h"
#include "cardsim/network_services.h"

#include <gtest/gtest.h>

#include <string>

namespace vqm::cardsim {
namespace {

using namespace std::chrono_literals;

class EngineTest : public ::testing::Test {
  protected:
    std::string Send(const std::string& text) {
        engine_.Feed(text.data(), text.size(), now_);
        return engine_.TakeOutput();
    }
    std::string Advance(Clock::duration by) {
        now_ += by;
        engine_.Tick(now_);
        return engine_.TakeOutput();
    }

    Clock::time_point now_ = Clock::time_point{} + 1h;
    CardEngine engine_{[] {
        EngineConfig config;
        config.dialDelayMs = 2000;
        config.ringRepeatMs = 3000;
        config.ringTimeoutMs = 10000;
        return config;
    }()};
};

TEST_F(EngineTest, EchoAndTheInitialisationTable) {
    engine_.AddCommandSet(std::make_unique<NetworkServices>());  // it owns "+CBST="
    EXPECT_EQ(Send("AT&F\r"), "AT&F\r\r\nOK\r\n");
    EXPECT_EQ(Send("ATE0\r"), "ATE0\r\r\nOK\r\n");  // echoed before it takes effect
    EXPECT_EQ(Send("ATE1\r"), "\r\nOK\r\n");
    for (const char* command : {"ATX5\r", "AT+CSCS=\"8859-1\"\r", "AT+CBST=51,0,1\r",
                                "AT+CLIP=1;+CRC=1\r", "AT+CNMI=1,1,0,0,0\r"})
        EXPECT_EQ(Send(command), std::string(command) + "\r\nOK\r\n") << command;
    EXPECT_EQ(Send("AT+FOO\r"), "AT+FOO\r\r\nERROR\r\n");
    EXPECT_EQ(Send("AT+CLIP=1;+BOGUS\r"), "AT+CLIP=1;+BOGUS\r\r\nERROR\r\n");
    EXPECT_EQ(Send("hello\r"), "hello\r\r\nERROR\r\n");
}

TEST_F(EngineTest, QueriesAnswerWithInformationLines) {
    Send("ATE0\r");
    EXPECT_EQ(Send("AT+GMR\r"), "\r\nSW4.00\r\n\r\nOK\r\n");
    EXPECT_EQ(Send("AT+CSQ\r"), "\r\n+CSQ: 20,0\r\n\r\nOK\r\n");
    EXPECT_EQ(Send("AT+COPS?\r"), "\r\n+COPS: 0,2,20201\r\n\r\nOK\r\n");
    EXPECT_EQ(Send("AT+CLVL=8\r"), "\r\nOK\r\n");
    EXPECT_EQ(Send("AT+CLVL?\r"), "\r\n+CLVL: 8\r\n\r\nOK\r\n");
    EXPECT_EQ(Send("AT+CLVL=11\r"), "\r\nERROR\r\n");
    EXPECT_EQ(Send("AT+CLCC\r"), "\r\nOK\r\n");  // no call
    engine_.ChangeConfig().firmware = "SW3.80";
    EXPECT_FLOAT_EQ(engine_.FirmwareVersion(), 3.8f);
}

TEST_F(EngineTest, DialOutcomesComeFromTheNetworkSide) {
    Send("ATE0\r");
    engine_.SetBusy("0123");
    engine_.SetUnanswered("0456");
    struct Case {
        const char* number;
        const char* result;
    };
    for (const Case& c : {Case{"+441234", "OK"}, Case{"0123", "BUSY"}, Case{"0456", "NO ANSWER"},
                          Case{"12a", "NO CARRIER"}}) {
        EXPECT_EQ(Send(std::string("ATD") + c.number + ";\r"), "");  // nothing until decided
        EXPECT_EQ(Advance(1999ms), "");
        std::string decided = Advance(1ms);
        EXPECT_NE(decided.find(std::string("\r\n") + c.result + "\r\n"), std::string::npos)
            << c.number << ": " << decided;
        Send("ATH\r");
    }
}

TEST_F(EngineTest, AnyInputAbortsAPendingDial) {
    Send("ATE0\r");
    Send("ATD+441234;\r");
    EXPECT_EQ(Send("AT+CLCC\r"), "\r\nNO CARRIER\r\n");
    EXPECT_EQ(engine_.State(), CallState::None);
    EXPECT_EQ(Advance(5000ms), "");  // no late result for the aborted dial
    EXPECT_EQ(Send("AT\r"), "\r\nOK\r\n");
}

TEST_F(EngineTest, OutgoingCallListAndFarEndHangUp) {
    Send("ATE0\r");
    Send("ATD+441234;\r");
    engine_.RemoteAnswer();
    EXPECT_EQ(engine_.TakeOutput(), "\r\nOK\r\n");
    EXPECT_EQ(Send("AT+CLCC\r"), "\r\n+CLCC: 1,0,0,0,0,\"+441234\",145\r\n\r\nOK\r\n");
    EXPECT_EQ(Send("AT+VTS=5\r"), "\r\nOK\r\n");
    EXPECT_EQ(engine_.DtmfSent(), std::vector<char>{'5'});
    engine_.RemoteHangUp();
    EXPECT_EQ(engine_.TakeOutput(), "\r\nNO CARRIER\r\n");
    EXPECT_EQ(Send("AT+CLCC\r"), "\r\nOK\r\n");
    EXPECT_EQ(Send("AT+VTS=5\r"), "\r\nERROR\r\n");  // no call to send tones into
}

TEST_F(EngineTest, IncomingCallRingsUntilAnsweredOrGivenUp) {
    Send("ATE0\r");
    engine_.Ring("+447700900123", now_);
    EXPECT_EQ(engine_.TakeOutput(), "\r\n+CRING: VOICE\r\n\r\n+CLIP: \"+447700900123\",145\r\n");
    EXPECT_EQ(Send("AT+CLCC\r"), "\r\n+CLCC: 1,1,4,0,0,\"+447700900123\",145\r\n\r\nOK\r\n");
    EXPECT_EQ(Advance(2999ms), "");
    EXPECT_NE(Advance(1ms).find("+CRING: VOICE"), std::string::npos);
    EXPECT_EQ(Send("ATA\r"), "\r\nOK\r\n");
    EXPECT_EQ(engine_.State(), CallState::Active);
    EXPECT_EQ(Advance(5000ms), "");  // an answered call rings no more
    Send("ATH\r");

    engine_.Ring("0123", now_);
    engine_.TakeOutput();
    EXPECT_EQ(Advance(10000ms), "");  // the caller gave up
    EXPECT_EQ(engine_.State(), CallState::None);
    EXPECT_EQ(Send("ATA\r"), "\r\nERROR\r\n");

    engine_.Ring("0123", now_);
    engine_.LocalAnswer();
    EXPECT_NE(Send("AT+CLCC\r").find("+CLCC: 1,1,0,0"), std::string::npos);
}

TEST_F(EngineTest, CallerNumberQuotingFollowsTheFirmware) {
    engine_.ChangeConfig().firmware = "SW3.81";
    engine_.Ring("0123", now_);
    EXPECT_NE(engine_.TakeOutput().find("\r\n+CLIP: 0123,129\r\n"), std::string::npos);
    engine_.CallerHangUp();
    engine_.ChangeConfig().firmware = "SW3.82";
    engine_.Ring("0123", now_);
    EXPECT_NE(engine_.TakeOutput().find("\r\n+CLIP: \"0123\",129\r\n"), std::string::npos);
}

TEST_F(EngineTest, SilenceAndGarbage) {
    engine_.SetSilent(true);
    EXPECT_EQ(Send("AT\r"), "");
    engine_.Ring("0123", now_);
    EXPECT_EQ(engine_.TakeOutput(), "");
    engine_.SetSilent(false);
    engine_.CallerHangUp();
    engine_.SendGarbage(64);
    EXPECT_EQ(engine_.TakeOutput().size(), 64u);
    EXPECT_EQ(Send("AT\r"), "AT\r\r\nOK\r\n");
}

// A hold lets other commands through, then swallows the one it names and everything after,
// rings included, until the silence is lifted or the power goes.
TEST_F(EngineTest, AHoldFallsSilentAtTheNamedCommandUntilLiftedOrPowerIsLost) {
    Send("ATE0\r");
    engine_.HoldAt("+CSQ");
    EXPECT_EQ(Send("AT+CLVL=8\r"), "\r\nOK\r\n");
    EXPECT_FALSE(engine_.Held());
    EXPECT_EQ(Send("AT+CSQ\r"), "");
    EXPECT_TRUE(engine_.Held());
    EXPECT_EQ(Send("AT\r"), "");
    engine_.Ring("0123", now_);
    EXPECT_EQ(engine_.TakeOutput(), "");
    engine_.SetSilent(false);
    EXPECT_FALSE(engine_.Held());
    engine_.CallerHangUp();
    EXPECT_EQ(Send("AT+CSQ\r"), "\r\n+CSQ: 20,0\r\n\r\nOK\r\n");  // the hold was used up

    engine_.HoldAt("+CSQ");
    Send("AT+CSQ\r");
    ASSERT_TRUE(engine_.Held());
    engine_.PowerLost();
    EXPECT_FALSE(engine_.Held());
    EXPECT_EQ(Send("AT\r"), "\r\nOK\r\n");
    // A hold still waiting goes with the power too.
    engine_.HoldAt("+CSQ");
    engine_.PowerLost();
    EXPECT_EQ(Send("AT+CSQ\r"), "\r\n+CSQ: 20,0\r\n\r\nOK\r\n");
}

}  // namespace
}  // namespace vqm::cardsim

namespace vqm::cardsim {
namespace {

// A command group that takes "+XW" with a prompt and "+XE" with an error of its own.
class PromptedGroup : public CommandSet {
  public:
    Handled Run(const std::string& upper, const std::string&, std::string& info,
                std::string& errorText) override {
        if (upper == "+XW") return Handled::Prompt;
        if (upper == "+XE") {
            errorText = "+CMS ERROR: 321";
            return Handled::Error;
        }
        if (upper == "+XI") {
            info += "\r\n+XI: 1\r\n";
            return Handled::Ok;
        }
        return Handled::No;
    }
    bool Complete(const std::string& text, std::string& info, std::string&) override {
        received = text;
        info += "\r\n+XW: 7\r\n";
        return text != "bad";
    }
    std::string received;
};

TEST(CommandGroups, PromptCollectsTextUntilCtrlZAndEscapeCancels) {
    CardEngine engine;
    auto group = std::make_unique<PromptedGroup>();
    PromptedGroup* seen = group.get();
    engine.AddCommandSet(std::move(group));
    const auto now = Clock::time_point{} + std::chrono::hours(1);
    auto send = [&](const std::string& text) {
        engine.Feed(text.data(), text.size(), now);
        return engine.TakeOutput();
    };
    EXPECT_EQ(send("ATE0\r"), "ATE0\r\r\nOK\r\n");
    EXPECT_EQ(send("AT+XW\r"), "\r\n> ");
    EXPECT_EQ(send("0011"), "");  // no echo with ATE0
    EXPECT_EQ(send("00\x1A"), "\r\n+XW: 7\r\n\r\nOK\r\n");
    EXPECT_EQ(seen->received, "001100");
    EXPECT_EQ(send("AT+XW\rbad\x1A"), "\r\n> \r\n+XW: 7\r\n\r\nERROR\r\n");
    EXPECT_EQ(send("AT+XW\rabc\x1B"), "\r\n> \r\nOK\r\n");
    EXPECT_EQ(seen->received, "bad");  // the cancelled text never reached the group
    // Chained commands: a group's own error text ends the line; its information lines stay.
    EXPECT_EQ(send("AT+XI;+XE;+CSQ\r"), "\r\n+XI: 1\r\n\r\n+CMS ERROR: 321\r\n");
    EXPECT_EQ(send("AT+XQ\r"), "\r\nERROR\r\n");  // nobody's command
}

}  // namespace
}  // namespace vqm::cardsim

namespace vqm::cardsim {
namespace {

TEST(CoreQueries, CharacterSetIsKeptAndTheRadioReportsOn) {
    CardEngine engine;
    const auto now = Clock::time_point{} + std::chrono::hours(1);
    auto send = [&](const std::string& text) {
        engine.Feed(text.data(), text.size(), now);
        return engine.TakeOutput();
    };
    send("ATE0\r");
    EXPECT_EQ(send("AT+CSCS?\r"), "\r\n+CSCS: \"8859-1\"\r\n\r\nOK\r\n");
    EXPECT_EQ(send("AT+CSCS=\"GSM\"\r"), "\r\nOK\r\n");
    EXPECT_EQ(engine.Charset(), "GSM");
    EXPECT_EQ(send("AT+CSCS=\"KOI8\"\r"), "\r\nERROR\r\n");
    EXPECT_EQ(engine.Charset(), "GSM");
    EXPECT_NE(send("AT+CSCS=?\r").find("\"UCS2\""), std::string::npos);
    EXPECT_EQ(send("AT&F\r"), "\r\nOK\r\n");
    EXPECT_EQ(engine.Charset(), "8859-1");  // back to what the dialer sets
    send("ATE0\r");
    EXPECT_EQ(send("AT+CFUN?\r"), "\r\n+CFUN: 1\r\n\r\nOK\r\n");
    EXPECT_EQ(send("AT+CIMI\r"), "\r\n202015550123456\r\n\r\nOK\r\n");
}

}  // namespace
}  // namespace vqm::cardsim

namespace vqm::cardsim {
namespace {

TEST(CoreQueries, ASemicolonInsideQuotesDoesNotChainACommand) {
    CardEngine engine;
    auto group = std::make_unique<PromptedGroup>();
    engine.AddCommandSet(std::move(group));
    const auto now = Clock::time_point{} + std::chrono::hours(1);
    const std::string line = "ATE0;+CSCS=\"IRA;\";+XI\r";
    engine.Feed(line.data(), line.size(), now);
    // "IRA;" is one (unknown) set, not "IRA" followed by a command "\"".
    EXPECT_EQ(engine.TakeOutput(), line + "\r\nERROR\r\n");
    const std::string chained = "AT+CSCS=\"IRA\";+XI\r";
    engine.Feed(chained.data(), chained.size(), now);
    EXPECT_EQ(engine.TakeOutput(), "\r\n+XI: 1\r\n\r\nOK\r\n");
}

}  // namespace
}  // namespace vqm::cardsim
