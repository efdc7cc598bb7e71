// The simulated card's network services on the AT engine alone: reply layouts, per-class
// states, password checks, network-side controls and the kept state.
#include "cardsim/network_services.h"

#include <gtest/gtest.h>

#include <sstream>
#include <string>

#include "cardsim/card_engine.h"

namespace vqm::cardsim {
namespace {

class NetworkServicesTest : public ::testing::Test {
  protected:
    NetworkServicesTest() {
        auto set = std::make_unique<NetworkServices>();
        services_ = set.get();
        engine_.AddCommandSet(std::move(set));
        Send("ATE0");
    }
    // One command line; the reply with its final result.
    std::string Send(const std::string& line) {
        const std::string bytes = line + "\r";
        engine_.Feed(bytes.data(), bytes.size(), Clock::time_point{});
        return engine_.TakeOutput();
    }
    static std::string Info(const std::string& lines) { return lines + "\r\n\r\nOK\r\n"; }

    CardEngine engine_;
    NetworkServices* services_ = nullptr;
};

constexpr char kOk[] = "\r\nOK\r\n";

TEST_F(NetworkServicesTest, OperatorListFollowsRegistrationAndTheNetworkSide) {
    EXPECT_EQ(Send("AT+COPS=?"), Info("\r\n+COPS: 2,,,20201,1,,,20205,1,,,20210,3,,,20801,"));
    EXPECT_EQ(Send("AT+COPS=1,2,20205"), kOk);
    EXPECT_EQ(engine_.Config().operatorCode, 20205);
    EXPECT_EQ(Send("AT+COPS?"), Info("\r\n+COPS: 1,2,20205"));  // manual now
    EXPECT_EQ(Send("AT+COPS=?"), Info("\r\n+COPS: 1,,,20201,2,,,20205,1,,,20210,3,,,20801,"));
    EXPECT_EQ(Send("AT+COPS=1,2,20801"), "\r\n+CME ERROR: 3\r\n");  // forbidden
    EXPECT_EQ(Send("AT+COPS=1,2,\"99999\""), "\r\n+CME ERROR: 30\r\n");
    EXPECT_EQ(Send("AT+COPS=1,0,\"COSMOTE\""), "\r\n+CME ERROR: 4\r\n");
    EXPECT_EQ(Send("AT+COPS=1,2"), "\r\nERROR\r\n");
    EXPECT_EQ(engine_.Config().operatorCode, 20205);
    EXPECT_EQ(Send("AT+COPS=0"), kOk);  // automatic keeps a usable current network
    EXPECT_EQ(engine_.Config().operatorCode, 20205);

    EXPECT_EQ(services_->Control("networks", "20210:2,20201:1,20205:3"), "OK");
    EXPECT_EQ(engine_.Config().operatorCode, 20210);
    EXPECT_EQ(Send("AT+COPS=?"), Info("\r\n+COPS: 2,,,20210,1,,,20201,3,,,20205,"));
    // The current network turns forbidden: automatic selection moves to the first usable one.
    EXPECT_EQ(services_->Control("networks", "20210:3,20205:3,20201:1"), "OK");
    EXPECT_EQ(Send("AT+COPS=0"), kOk);
    EXPECT_EQ(engine_.Config().operatorCode, 20201);
    EXPECT_EQ(services_->Control("networks", "20201:3"), "OK");
    EXPECT_EQ(Send("AT+COPS=0"), "\r\n+CME ERROR: 30\r\n");
    EXPECT_EQ(services_->Control("networks", "none"), "OK");
    EXPECT_EQ(Send("AT+COPS=?"), Info("\r\n+COPS: "));
    for (const char* bad : {"2020:1", "202010:1", "20201:4", "20201", "20201:1,", ""})
        EXPECT_EQ(services_->Control("networks", bad).rfind("ERROR", 0), 0u) << bad;
    EXPECT_EQ(services_->Control("ring", "123"), "");  // not this group's
}

TEST_F(NetworkServicesTest, ForwardsAreKeptPerReasonAndClass) {
    EXPECT_EQ(Send("AT+CCFC=2,2,,,1"), Info("\r\n+CCFC: 0,1"));
    EXPECT_EQ(Send("AT+CCFC=2,3,\"+447700900123\",145,1,,,30"), kOk);
    EXPECT_EQ(Send("AT+CCFC=2,2,,,1"), Info("\r\n+CCFC: 1,1,\"+447700900123\",145,,,30"));
    EXPECT_EQ(Send("AT+CCFC=2,2,,,7"), Info("\r\n+CCFC: 1,1,\"+447700900123\",145,,,30"));
    EXPECT_EQ(Send("AT+CCFC=2,2,,,2"), Info("\r\n+CCFC: 0,2"));
    EXPECT_EQ(Send("AT+CCFC=0,2,,,1"), Info("\r\n+CCFC: 0,1"));

    // Without a class all three are registered; the type follows the number.
    EXPECT_EQ(Send("AT+CCFC=1,3,\"0123\""), kOk);
    EXPECT_EQ(Send("AT+CCFC=1,2"), Info("\r\n+CCFC: 1,1,\"0123\",129\r\n\r\n+CCFC: 1,2,\"0123\","
                                        "129\r\n\r\n+CCFC: 1,4,\"0123\",129"));
    // Disabling every forward of data keeps its number for a later enable.
    EXPECT_EQ(Send("AT+CCFC=4,0,,,2"), kOk);
    EXPECT_EQ(Send("AT+CCFC=1,2,,,2"), Info("\r\n+CCFC: 0,2"));
    EXPECT_EQ(Send("AT+CCFC=2,2,,,1"), Info("\r\n+CCFC: 1,1,\"+447700900123\",145,,,30"));
    EXPECT_EQ(Send("AT+CCFC=1,1,,,2"), kOk);
    EXPECT_EQ(Send("AT+CCFC=1,2,,,2"), Info("\r\n+CCFC: 1,2,\"0123\",129"));
    // Erasure forgets the number, so there is nothing left to enable.
    EXPECT_EQ(Send("AT+CCFC=1,4"), kOk);
    EXPECT_EQ(Send("AT+CCFC=1,1"), "\r\n+CME ERROR: 3\r\n");
    EXPECT_EQ(Send("AT+CCFC=4,0,,,7"), kOk);
    EXPECT_EQ(Send("AT+CCFC=2,2,,,1"), Info("\r\n+CCFC: 0,1"));

    EXPECT_EQ(Send("AT+CCFC=0,3,\"12a\""), "\r\n+CME ERROR: 3\r\n");
    EXPECT_EQ(Send("AT+CCFC=0,3"), "\r\n+CME ERROR: 3\r\n");
    EXPECT_EQ(Send("AT+CCFC=4,2"), "\r\n+CME ERROR: 3\r\n");
    EXPECT_EQ(Send("AT+CCFC=6,2"), "\r\nERROR\r\n");
    EXPECT_EQ(Send("AT+CCFC=0,2,,,8"), "\r\n+CME ERROR: 3\r\n");  // no voice, data or fax bit

    EXPECT_EQ(services_->Control("forward", "3 5 on 0999"), "OK");
    EXPECT_EQ(Send("AT+CCFC=3,2,,,7"),
              Info("\r\n+CCFC: 1,1,\"0999\",129\r\n\r\n+CCFC: 1,4,\"0999\",129"));
    EXPECT_EQ(services_->Control("forward", "3 1 off"), "OK");
    EXPECT_EQ(services_->Control("forward", "3 1 on"), "OK");  // the number is still there
    EXPECT_EQ(services_->Control("forward", "3 2 on").rfind("ERROR", 0), 0u);
    EXPECT_EQ(Send("AT+CCFC=3,2,,,2"), Info("\r\n+CCFC: 0,2"));  // the failed control did nothing
    EXPECT_EQ(services_->Control("forward", "4 1 on 1").rfind("ERROR", 0), 0u);
}

TEST_F(NetworkServicesTest, BarringNeedsThePasswordAndIsReportedAsOneSum) {
    EXPECT_EQ(Send("AT+CLCK=\"AO\",2"), Info("\r\n+CLCK: 0,7"));
    EXPECT_EQ(Send("AT+CLCK=\"AO\",1,\"1234\",1"), "\r\n+CME ERROR: 16\r\n");
    EXPECT_EQ(Send("AT+CLCK=\"AO\",1,,1"), "\r\n+CME ERROR: 16\r\n");
    EXPECT_EQ(Send("AT+CLCK=\"AO\",2"), Info("\r\n+CLCK: 0,7"));
    EXPECT_EQ(Send("AT+CLCK=\"AO\",1,\"0000\",1"), kOk);
    EXPECT_EQ(Send("at+clck=\"ao\",1,\"0000\",4"), kOk);
    EXPECT_EQ(Send("AT+CLCK=\"AO\",2"), Info("\r\n+CLCK: 1,5"));
    EXPECT_EQ(Send("AT+CLCK=\"AO\",2,,4"), Info("\r\n+CLCK: 1,4"));
    EXPECT_EQ(Send("AT+CLCK=\"AO\",2,,2"), Info("\r\n+CLCK: 0,2"));
    EXPECT_EQ(Send("AT+CLCK=\"AG\",2"), Info("\r\n+CLCK: 1,5"));
    EXPECT_EQ(Send("AT+CLCK=\"AC\",2"), Info("\r\n+CLCK: 0,7"));

    // The group facilities only lift.
    EXPECT_EQ(Send("AT+CLCK=\"AB\",1,\"0000\",7"), "\r\n+CME ERROR: 3\r\n");
    EXPECT_EQ(Send("AT+CLCK=\"IR\",1,\"0000\",7"), kOk);
    EXPECT_EQ(Send("AT+CLCK=\"AG\",0,\"0000\",1"), kOk);
    EXPECT_EQ(Send("AT+CLCK=\"AO\",2"), Info("\r\n+CLCK: 1,4"));
    EXPECT_EQ(Send("AT+CLCK=\"IR\",2"), Info("\r\n+CLCK: 1,7"));  // incoming untouched
    EXPECT_EQ(Send("AT+CLCK=\"AB\",0,\"9999\",7"), "\r\n+CME ERROR: 16\r\n");
    EXPECT_EQ(Send("AT+CLCK=\"AB\",0,\"0000\",7"), kOk);
    EXPECT_EQ(Send("AT+CLCK=\"AB\",2"), Info("\r\n+CLCK: 0,7"));

    EXPECT_EQ(services_->Control("barring", "OI 6 on"), "OK");
    EXPECT_EQ(Send("AT+CLCK=\"OI\",2"), Info("\r\n+CLCK: 1,6"));
    EXPECT_EQ(services_->Control("barring", "AB 2 off"), "OK");
    EXPECT_EQ(Send("AT+CLCK=\"OI\",2"), Info("\r\n+CLCK: 1,4"));
    EXPECT_EQ(services_->Control("barring", "AB 7 on").rfind("ERROR", 0), 0u);
    EXPECT_EQ(services_->Control("barring", "XX 1 on").rfind("ERROR", 0), 0u);

    EXPECT_EQ(Send("AT+CLCK=\"FD\",2"), "\r\n+CME ERROR: 4\r\n");
    EXPECT_EQ(Send("AT+CLCK=\"AO\""), "\r\nERROR\r\n");
}

TEST_F(NetworkServicesTest, SimLocksAndCodeChanges) {
    EXPECT_EQ(Send("AT+CLCK=\"SC\",2"), Info("\r\n+CLCK: 0"));
    EXPECT_EQ(Send("AT+CLCK=\"P2\",2"), Info("\r\n+CLCK: 1"));
    // A PIN whose request is off cannot be changed; once on, the old PIN must match.
    EXPECT_EQ(Send("AT+CPWD=\"SC\",\"1234\",\"4321\",7"), "\r\n+CME ERROR: 3\r\n");
    EXPECT_EQ(Send("AT+CLCK=\"SC\",1,\"1111\",7"), "\r\n+CME ERROR: 16\r\n");
    EXPECT_EQ(Send("AT+CLCK=\"SC\",1,\"1234\",7"), kOk);
    EXPECT_EQ(Send("AT+CLCK=\"SC\",2"), Info("\r\n+CLCK: 1"));
    EXPECT_EQ(Send("AT+CPWD=\"SC\",\"1111\",\"4321\",7"), "\r\n+CME ERROR: 16\r\n");
    EXPECT_EQ(Send("AT+CPWD=\"SC\",\"1234\",\"12\",7"), "\r\n+CME ERROR: 3\r\n");
    EXPECT_EQ(Send("AT+CPWD=\"SC\",\"1234\",\"4321\",7"), kOk);
    EXPECT_EQ(Send("AT+CLCK=\"SC\",0,\"1234\",7"), "\r\n+CME ERROR: 16\r\n");
    EXPECT_EQ(Send("AT+CLCK=\"SC\",0,\"4321\",7"), kOk);

    EXPECT_EQ(Send("AT+CPWD=\"P2\",\"5678\",\"8765\""), kOk);  // the class is optional
    EXPECT_EQ(Send("AT+CLCK=\"PS\",1,\"12345\",7"), kOk);
    EXPECT_EQ(Send("AT+CLCK=\"PS\",2"), Info("\r\n+CLCK: 1"));

    // Every barring facility changes the one network password, which must be four digits.
    EXPECT_EQ(Send("AT+CPWD=\"AB\",\"0000\",\"12345\",7"), "\r\n+CME ERROR: 3\r\n");
    EXPECT_EQ(Send("AT+CPWD=\"OI\",\"0000\",\"2468\",7"), kOk);
    EXPECT_EQ(Send("AT+CLCK=\"AI\",1,\"0000\",1"), "\r\n+CME ERROR: 16\r\n");
    EXPECT_EQ(Send("AT+CLCK=\"AI\",1,\"2468\",1"), kOk);
    EXPECT_EQ(services_->Control("password", "AB 1357"), "OK");
    EXPECT_EQ(Send("AT+CLCK=\"AI\",0,\"1357\",1"), kOk);
    EXPECT_EQ(services_->Control("password", "SC 12"), services_->Control("password", "ZZ 1234"));
    EXPECT_EQ(Send("AT+CPWD=\"XX\",\"1\",\"2\""), "\r\n+CME ERROR: 4\r\n");
}

// Three wrong PINs in a row block the code, whichever command carried them; a right one in
// between gives the tries back. A blocked PIN answers every use with "PUK required" until the
// network side resets the SIM.
TEST_F(NetworkServicesTest, WrongPinsBlockTheSimUntilItIsReset) {
    struct Case {
        const char* wrong;  // a command with a wrong code
        const char* right;  // the same with the right one
        const char* query;  // what the blocked code refuses as well
        const char* puk;    // the blocked code's answer
        int pin;
    };
    const Case cases[] = {
        {"AT+CLCK=\"SC\",1,\"9999\",7", "AT+CLCK=\"SC\",1,\"1234\",7", "AT+CLCK=\"SC\",2",
         "\r\n+CME ERROR: 12\r\n", 0},
        {"AT+CPWD=\"SC\",\"9999\",\"4321\",7", "AT+CPWD=\"SC\",\"1234\",\"1234\",7",
         "AT+CLCK=\"SC\",0,\"1234\",7", "\r\n+CME ERROR: 12\r\n", 0},
        {"AT+CLCK=\"P2\",1,\"9999\",7", "AT+CLCK=\"P2\",1,\"5678\",7",
         "AT+CPWD=\"P2\",\"5678\",\"8765\",7", "\r\n+CME ERROR: 18\r\n", 1},
    };
    const std::string wrongPin = "\r\n+CME ERROR: 16\r\n";
    for (const Case& c : cases) {
        services_->FillDemo();
        EXPECT_EQ(Send("AT+CLCK=\"SC\",1,\"1234\",7"), kOk) << c.wrong;  // the request on
        EXPECT_EQ(Send(c.wrong), wrongPin) << c.wrong;
        EXPECT_EQ(Send(c.wrong), wrongPin) << c.wrong;
        EXPECT_EQ(Send(c.right), kOk) << c.right;  // two wrong, then right: all tries back
        EXPECT_EQ(services_->TriesLeft(c.pin), NetworkServices::kPinTries);
        EXPECT_EQ(Send(c.wrong), wrongPin) << c.wrong;
        EXPECT_EQ(Send(c.wrong), wrongPin) << c.wrong;
        EXPECT_EQ(Send(c.wrong), c.puk) << c.wrong;
        EXPECT_EQ(services_->TriesLeft(c.pin), 0);
        EXPECT_EQ(Send(c.right), c.puk) << c.right;
        EXPECT_EQ(Send(c.query), c.puk) << c.query;
        // The other PIN and the barring password are not touched.
        EXPECT_EQ(services_->TriesLeft(1 - c.pin), NetworkServices::kPinTries);
        EXPECT_EQ(Send("AT+CLCK=\"AO\",1,\"0000\",1"), kOk);

        std::ostringstream saved;
        services_->Save(saved);
        EXPECT_NE(saved.str().find("net-tries"), std::string::npos);
        EXPECT_EQ(services_->Control("sim-reset", ""), "OK");
        EXPECT_EQ(Send(c.right), kOk) << c.right;
        // A blocked SIM stays blocked across a restart of the card.
        std::istringstream lines(saved.str());
        std::string line;
        while (std::getline(lines, line)) {
            const size_t space = line.find(' ');
            services_->Load(line.substr(0, space), line.substr(space + 1));
        }
        EXPECT_EQ(Send(c.right), c.puk) << c.right;
    }
}

TEST_F(NetworkServicesTest, BearerAndHscsdSettings) {
    EXPECT_EQ(Send("AT+CBST=51,0,1;+CHSN=3,0,0,0"), kOk);
    EXPECT_EQ(Send("AT+CBST?;+CHSN?"), Info("\r\n+CBST: 51,0,1\r\n\r\n+CHSN: 3,0,0,0"));
    EXPECT_EQ(Send("AT+CBST=71"), kOk);  // omitted values stay
    EXPECT_EQ(Send("AT+CBST?"), Info("\r\n+CBST: 71,0,1"));
    for (const char* bad : {"AT+CBST=", "AT+CBST=135", "AT+CBST=7,0,4", "AT+CBST=7,0,1,0",
                            "AT+CHSN=8", "AT+CHSN=1,9", "AT+CHSN=x"})
        EXPECT_EQ(Send(bad), "\r\nERROR\r\n") << bad;
    EXPECT_EQ(Send("AT+CBST?;+CHSN?"), Info("\r\n+CBST: 71,0,1\r\n\r\n+CHSN: 3,0,0,0"));
}

TEST_F(NetworkServicesTest, ChangesMoveTheRevisionAndSurviveSaveAndLoad) {
    unsigned long revision = engine_.Revision();
    Send("AT+CLCK=\"AO\",2");
    Send("AT+CCFC=0,2,,,1");
    Send("AT+CLCK=\"AO\",1,\"9999\",1");  // refused
    EXPECT_EQ(engine_.Revision(), revision);
    for (const char* change :
         {"AT+CLCK=\"AO\",1,\"0000\",1", "AT+CCFC=0,3,\"+4477\",,1",
          "AT+CCFC=2,3,\"0123\",129,4,,,10", "AT+CCFC=2,0,,,4", "AT+CPWD=\"AB\",\"0000\",\"4444\"",
          "AT+CLCK=\"SC\",1,\"1234\"", "AT+CBST=81,0,1", "AT+CHSN=6,0,0,0", "AT+COPS=1,2,20210"}) {
        EXPECT_EQ(Send(change), kOk) << change;
        EXPECT_GT(engine_.Revision(), revision) << change;
        revision = engine_.Revision();
    }
    services_->Control("networks", "20201:1,20210:1,20205:3");
    std::ostringstream saved;
    services_->Save(saved);

    CardEngine other;
    auto set = std::make_unique<NetworkServices>();
    NetworkServices* loaded = set.get();
    other.AddCommandSet(std::move(set));
    std::istringstream lines(saved.str() + "net-forward 9 1 x 1 1 1\nnet-barring AO\n");
    std::string line;
    while (std::getline(lines, line)) {
        const size_t space = line.find(' ');
        EXPECT_TRUE(loaded->Load(line.substr(0, space), line.substr(space + 1))) << line;
    }
    EXPECT_FALSE(loaded->Load("operator", "20201"));
    std::ostringstream again;
    loaded->Save(again);
    EXPECT_EQ(again.str(), saved.str());

    // The loaded card acts on what it read.
    auto send = [&](const std::string& text) {
        const std::string bytes = "ATE0;" + text + "\r";
        other.Feed(bytes.data(), bytes.size(), Clock::time_point{});
        std::string out = other.TakeOutput();
        return out.substr(out.find("\r\n"));
    };
    EXPECT_EQ(send("+CCFC=0,2,,,1"), Info("\r\n+CCFC: 1,1,\"+4477\",145"));
    EXPECT_EQ(send("+CCFC=2,1,,,4"), kOk);  // kept though disabled
    EXPECT_EQ(send("+CLCK=\"AO\",0,\"4444\",1"), kOk);
    EXPECT_EQ(send("+CLCK=\"SC\",2"), Info("\r\n+CLCK: 1"));
    EXPECT_EQ(send("+CBST?"), Info("\r\n+CBST: 81,0,1"));
}

}  // namespace
}  // namespace vqm::cardsim
