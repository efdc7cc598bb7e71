// The simulated card's standard 27.007 personality on the bare engine, with handed-in time, set
// against the card's own dialect where the two differ.
#include <gtest/gtest.h>

#include <functional>
#include <string>
#include <vector>

#include "cardsim/card_engine.h"
#include "cardsim/card_sim.h"
#include "cardsim/network_services.h"

namespace vqm::cardsim {
namespace {

using namespace std::chrono_literals;

EngineConfig Config(Dialect dialect) {
    EngineConfig config;
    config.dialect = dialect;
    config.dialDelayMs = 2000;
    config.ringRepeatMs = 3000;
    config.ringTimeoutMs = 10000;
    return config;
}

class Modem {
  public:
    explicit Modem(Dialect dialect) : engine(Config(dialect)) {
        engine.AddCommandSet(std::make_unique<NetworkServices>());
    }
    std::string Send(const std::string& text) {
        engine.Feed(text.data(), text.size(), now);
        return engine.TakeOutput();
    }
    // Byte by byte, as the dialer writes; the output of every byte kept in order.
    std::string Type(const std::string& text) {
        for (char c : text)
            engine.Feed(&c, 1, now);
        return engine.TakeOutput();
    }
    std::string Advance(Clock::duration by) {
        now += by;
        engine.Tick(now);
        return engine.TakeOutput();
    }

    Clock::time_point now = Clock::time_point{} + 1h;
    CardEngine engine;
};

std::string Lines(std::initializer_list<const char*> lines) {
    std::string out;
    for (const char* line : lines)
        out += std::string("\r\n") + line + "\r\n";
    return out;
}

class StandardModem : public ::testing::Test {
  protected:
    Modem modem_{Dialect::Standard};
};

TEST_F(StandardModem, RepliesInOrder) {
    struct Step {
        const char* command;
        std::string reply;
    };
    const Step steps[] = {
        {"ATE1\r", Lines({"OK"})},  // no echo, whatever ATE says
        {"AT+GMR\r", Lines({"REV1", "OK"})},
        {"AT+CGMR\r", Lines({"REV1", "OK"})},
        {"AT+COPS?\r", Lines({"+COPS: 0,0,\"COSMOTE\"", "OK"})},
        {"AT+COPS=3,2\r", Lines({"OK"})},
        {"AT+COPS?\r", Lines({"+COPS: 0,2,\"20201\"", "OK"})},
        {"AT+COPS=3,0\r", Lines({"OK"})},
        {"AT+COPS?\r", Lines({"+COPS: 0,0,\"COSMOTE\"", "OK"})},
        {"AT+COPS=3,9\r", Lines({"+CME ERROR: 4"})},
        {"AT+CSQ\r", Lines({"+CSQ: 20,0", "OK"})},
        {"AT+CLVL=11\r", Lines({"+CME ERROR: 50"})},
        {"AT+VTS=5\r", Lines({"+CME ERROR: 3"})},  // no call to send tones into
        {"ATA\r", Lines({"+CME ERROR: 3"})},       // nothing ringing
        {"AT+CMEE?\r", Lines({"+CMEE: 1", "OK"})},
        {"AT+FOO\r", Lines({"ERROR"})},  // a command it does not know is no ME error
        {"AT+CMEE=2\r", Lines({"OK"})},
        {"AT+VTS=5\r", Lines({"+CME ERROR: operation not allowed"})},
        {"AT+CMEE=0\r", Lines({"OK"})},
        {"AT+CLVL=11\r", Lines({"ERROR"})},
        {"AT+CMEE=3\r", Lines({"ERROR"})},
        {"AT+CLIP?\r", Lines({"+CLIP: 0,1", "OK"})},
        {"AT+CLIP=1;+CRC=1\r", Lines({"OK"})},
        {"AT+CLIP?;+CRC?\r", Lines({"+CLIP: 1,1", "+CRC: 1", "OK"})},
    };
    for (const Step& step : steps)
        EXPECT_EQ(modem_.Send(step.command), step.reply) << step.command;
    // Back from a power cut, the start-up settings hold again.
    modem_.engine.PowerLost();
    EXPECT_EQ(modem_.Send("AT+CLIP?;+CRC?;+CMEE?\r"),
              Lines({"+CLIP: 0,1", "+CRC: 0", "+CMEE: 1", "OK"}));
}

TEST_F(StandardModem, OperatorFormatTakesACodeTheNamesDoNotKnow) {
    modem_.engine.SetOperator(23415);
    modem_.engine.TakeOutput();
    EXPECT_EQ(modem_.Send("AT+COPS?\r"), Lines({"+COPS: 0,0,\"NET 23415\"", "OK"}));
    modem_.Send("AT+COPS=3,2\r");
    EXPECT_EQ(modem_.Send("AT+COPS?\r"), Lines({"+COPS: 0,2,\"23415\"", "OK"}));
}

TEST(CallerId, RingAndCallerAsTheSettingsAndTheNumberSay) {
    struct Case {
        Dialect dialect;
        const char* settings;
        const char* number;
        const char* firmware;
        std::string rings;
    };
    const Case cases[] = {
        {Dialect::Standard, "AT+CLIP=1;+CRC=1\r", "+4915112345678", "SW4.00",
         Lines({"*ECAV: 1,6,1", "+CRING: VOICE", "+CLIP: \"4915112345678\",145,,,,0"})},
        {Dialect::Standard, "AT+CLIP=1;+CRC=0\r", "0123", "SW4.00",
         Lines({"*ECAV: 1,6,1", "RING", "+CLIP: \"0123\",129,,,,0"})},
        {Dialect::Standard, "AT+CLIP=0;+CRC=1\r", "0123", "SW4.00",
         Lines({"*ECAV: 1,6,1", "+CRING: VOICE"})},
        // The standard modem quotes whatever firmware the card would have.
        {Dialect::Standard, "AT+CLIP=1;+CRC=1\r", "+44770", "SW3.80",
         Lines({"*ECAV: 1,6,1", "+CRING: VOICE", "+CLIP: \"44770\",145,,,,0"})},
        // The card: always +CRING and the caller, with its '+', bare up to firmware 3.81.
        {Dialect::Card, "AT+CLIP=0;+CRC=0\r", "+44770", "SW3.80",
         Lines({"+CRING: VOICE", "+CLIP: +44770,145"})},
        {Dialect::Card, "AT+CLIP=1;+CRC=1\r", "+44770", "SW4.00",
         Lines({"+CRING: VOICE", "+CLIP: \"+44770\",145"})},
    };
    for (const Case& c : cases) {
        Modem modem(c.dialect);
        modem.engine.ChangeConfig().firmware = c.firmware;
        modem.Send("ATE0\r");
        ASSERT_EQ(modem.Send(c.settings), Lines({"OK"})) << c.settings;
        modem.engine.Ring(c.number, modem.now);
        EXPECT_EQ(modem.engine.TakeOutput(), c.rings) << c.number << " " << c.settings;
        // Repeats carry the ring and the caller again, without a new state report.
        const std::string repeat = modem.Advance(3000ms);
        EXPECT_EQ(repeat.find("*ECAV"), std::string::npos);
        EXPECT_EQ(repeat.find("+CLIP") != std::string::npos,
                  c.rings.find("+CLIP") != std::string::npos)
            << repeat;
    }
}

TEST_F(StandardModem, AVendorLineFollowsEveryChangeOfACall) {
    struct Step {
        const char* what;
        std::function<std::string(Modem&)> act;
        std::string output;
    };
    modem_.engine.SetBusy("0800");
    const std::vector<Step> steps = {
        {"ring",
         [](Modem& m) {
             m.engine.Ring("0123", m.now);
             return m.engine.TakeOutput();
         },
         Lines({"*ECAV: 1,6,1", "RING"})},
        {"answer", [](Modem& m) { return m.Send("ATA\r"); }, Lines({"*ECAV: 1,3,1", "OK"})},
        {"hang up", [](Modem& m) { return m.Send("ATH\r"); }, Lines({"*ECAV: 1,0,1", "OK"})},
        {"dial", [](Modem& m) { return m.Send("ATD+441234;\r"); }, Lines({"*ECAV: 1,1,1"})},
        {"connected", [](Modem& m) { return m.Advance(2000ms); }, Lines({"*ECAV: 1,3,1", "OK"})},
        {"far end hangs up",
         [](Modem& m) {
             m.engine.RemoteHangUp();
             return m.engine.TakeOutput();
         },
         Lines({"*ECAV: 1,0,1", "NO CARRIER"})},
        {"dial a busy number", [](Modem& m) { return m.Send("ATD0800;\r"); },
         Lines({"*ECAV: 1,1,1"})},
        {"busy", [](Modem& m) { return m.Advance(2000ms); }, Lines({"*ECAV: 1,0,1", "BUSY"})},
        {"ring, caller gives up",
         [](Modem& m) {
             m.engine.Ring("0123", m.now);
             m.engine.CallerHangUp();
             return m.engine.TakeOutput();
         },
         Lines({"*ECAV: 1,6,1", "RING", "*ECAV: 1,0,1"})},
        {"signal",
         [](Modem& m) {
             m.engine.SetSignal(7);
             return m.engine.TakeOutput();
         },
         Lines({"^RSSI: 7"})},
        {"same signal",
         [](Modem& m) {
             m.engine.SetSignal(7);
             return m.engine.TakeOutput();
         },
         ""},
        {"network",
         [](Modem& m) {
             m.engine.SetOperator(20205);
             return m.engine.TakeOutput();
         },
         Lines({"+CREG: 1"})},
    };
    for (const Step& step : steps)
        EXPECT_EQ(step.act(modem_), step.output) << step.what;

    // The card's own dialect reports none of it.
    Modem card(Dialect::Card);
    card.Send("ATE0\r");
    card.engine.Ring("0123", card.now);
    card.engine.TakeOutput();
    EXPECT_EQ(card.Send("ATA\r"), Lines({"OK"}));
    card.engine.SetSignal(3);
    EXPECT_EQ(card.engine.TakeOutput(), "");
}

TEST_F(StandardModem, UnsolicitedLinesGoOutAtOnceAndBetweenReplyLines) {
    // In the middle of a command being typed.
    EXPECT_EQ(modem_.Type("AT+CS"), "");
    modem_.engine.Unsolicited("+CMTI: \"SM\",3");
    EXPECT_EQ(modem_.engine.TakeOutput(), Lines({"+CMTI: \"SM\",3"}));
    EXPECT_EQ(modem_.Type("Q\r"), Lines({"+CSQ: 20,0", "OK"}));

    // A reply not yet taken gets them between its lines, in the order they came.
    modem_.engine.Feed("AT+CSQ\r", 7, modem_.now);
    modem_.engine.Unsolicited("RING");
    modem_.engine.Unsolicited("+CLIP: \"0123\",129,,,,0");
    EXPECT_EQ(modem_.engine.TakeOutput(),
              Lines({"+CSQ: 20,0", "RING", "+CLIP: \"0123\",129,,,,0", "OK"}));

    // Handed out a line at a time, the rest of a reply still lets a line in before it.
    modem_.engine.Feed("AT+CSQ\r", 7, modem_.now);
    EXPECT_EQ(modem_.engine.TakeOutputLine(), Lines({"+CSQ: 20,0"}));
    modem_.engine.Unsolicited("^RSSI: 3");
    EXPECT_EQ(modem_.engine.TakeOutputLine(), Lines({"^RSSI: 3"}));
    EXPECT_EQ(modem_.engine.TakeOutputLine(), Lines({"OK"}));
    EXPECT_EQ(modem_.engine.TakeOutputLine(), "");

    // A pending dial holds nothing back.
    modem_.Send("ATD+441234;\r");
    modem_.engine.Unsolicited("+CMTI: \"SM\",4");
    EXPECT_EQ(modem_.engine.TakeOutput(), Lines({"+CMTI: \"SM\",4"}));
}

TEST(VendorNoise, NowAndThenOnAStandardModemOnly) {
    for (Dialect dialect : {Dialect::Standard, Dialect::Card}) {
        EngineConfig config = Config(dialect);
        config.vendorNoiseMs = 1000;
        CardEngine engine(config);
        auto at = Clock::time_point{} + 1h;
        std::string out;
        for (int ms = 0; ms <= 3500; ms += 100) {
            engine.Tick(at + std::chrono::milliseconds(ms));
            out += engine.TakeOutput();
        }
        EXPECT_EQ(out,
                  dialect == Dialect::Card ? "" : Lines({"^RSSI: 20", "+CREG: 1", "^MODE: 3,2"}));
    }
}

TEST(CardDialect, UnsolicitedLinesWaitForAPendingDial) {
    Modem card(Dialect::Card);
    card.Send("ATE0\r");
    card.Send("ATD+441234;\r");
    card.engine.Unsolicited("+CMTI: \"SM\",4");
    EXPECT_EQ(card.engine.TakeOutput(), "");
    EXPECT_EQ(card.Advance(2000ms), Lines({"OK", "+CMTI: \"SM\",4"}));
}

// An unsolicited line injected at every byte of a command and its reply: it comes out once,
// whole, and the reply around it is whole too.
TEST(Injection, AtEveryByteOfAnExchange) {
    const std::string command = "AT+CLVL?\r";
    const std::string urc = Lines({"+CMTI: \"SM\",1"});
    for (Dialect dialect : {Dialect::Standard, Dialect::Card}) {
        const bool standard = dialect == Dialect::Standard;
        const std::string echo = standard ? "" : command;
        const std::string reply = Lines({"+CLVL: 5", "OK"});
        // Where a standard modem may put a line in this reply: either end, or between lines.
        const std::vector<size_t> boundaries = {0, 12, reply.size()};
        for (size_t at = 0; at <= command.size() + reply.size() + 2; ++at) {
            Modem modem(dialect);
            if (!standard) modem.Send("ATE1\r");
            modem.engine.InjectUnsolicited("+CMTI: \"SM\",1", at);
            const std::string out = modem.Type(command);
            std::string expected;
            if (at < command.size()) {
                expected = echo.substr(0, standard ? 0 : at) + urc +
                           echo.substr(standard ? 0 : at) + reply;
            } else if (!standard) {
                expected = echo + reply + urc;  // the card never breaks up a reply
            } else {
                size_t place = reply.size();
                for (size_t b : boundaries)
                    if (b >= at - command.size() && b < place) place = b;
                expected = reply.substr(0, place) + urc + reply.substr(place);
            }
            EXPECT_EQ(out, expected) << (standard ? "standard" : "card") << " at " << at;
            EXPECT_EQ(modem.Type("AT\r"), echo.empty() ? Lines({"OK"}) : "AT\r" + Lines({"OK"}))
                << "the injection is used up";
        }
    }
}

TEST(CardPower, LosingPowerDropsTheCall) {
    struct Case {
        const char* setUp;
        const char* powerOff;
    };
    const Case cases[] = {
        {"local-answer", "pull"}, {"local-answer", "power-down"}, {"", "pull"}};  // still ringing
    for (const Case& c : cases) {
        SimConfig config;
        config.baud = 0;
        CardSim sim(config);
        ASSERT_TRUE(sim.PowerUp());
        ASSERT_EQ(sim.Control("ring +447700900123"), "OK");
        if (*c.setUp) ASSERT_EQ(sim.Control(c.setUp), "OK");
        EXPECT_EQ(sim.Control("status").find("call=none"), std::string::npos);
        ASSERT_EQ(sim.Control(c.powerOff), "OK");
        if (std::string(c.powerOff) == "pull") ASSERT_EQ(sim.Control("insert"), "OK");
        ASSERT_EQ(sim.Control("power-up"), "OK");
        const std::string status = sim.Control("status");
        EXPECT_NE(status.find("call=none"), std::string::npos) << c.powerOff << ": " << status;
        EXPECT_EQ(status.find("number="), std::string::npos) << status;
    }
}

}  // namespace
}  // namespace vqm::cardsim
