// The settings wrappers against a scripted card: the command each one sends, byte for byte,
// the arguments that send nothing, and how the reply becomes the result.
#include <gtest/gtest.h>

#include <chrono>
#include <cstring>
#include <functional>
#include <iterator>
#include <map>
#include <memory>
#include <mutex>
#include <string>
#include <thread>
#include <vector>

#include "link/link.h"
#include "settings/barring_at.h"
#include "settings/forwarding_at.h"
#include "settings/network_at.h"
#include "settings/security_at.h"
#include "support/settings_store.h"
#include "tests/common/fake_card.h"
#include "tests/common/link_waits.h"
#include "tests/common/temp_folder.h"

namespace vqm {
namespace {

using testing::FakeCard;
using testing::TempFolder;

const std::string kOk = "\r\nOK\r\n";
const std::string kError = "\r\nERROR\r\n";

class CommandsTest : public ::testing::Test {
  protected:
    CommandsTest()
        : card_([this](const std::string& line) {
              std::lock_guard<std::mutex> lock(mutex_);
              // The listener's call poll runs on its own; it is not what these tests look at.
              if (line == "AT+CLCC") return kOk;
              sent_.push_back(line);
              auto reply = replies_.find(line);
              return reply == replies_.end() ? kOk : reply->second;
          }) {
        link_ = std::make_unique<Link>(settings_, DriverRoots{temp_ / "run", temp_ / "tty"});
        testing::ShortenLinkWaits(*link_);
        EXPECT_EQ(PortOpenDevice(*link_, card_.Device().c_str()), 1);
        Sent();  // the initialisation is not under test
    }
    ~CommandsTest() override { PortClose(*link_); }

    void Answer(const std::string& command, const std::string& reply) {
        std::lock_guard<std::mutex> lock(mutex_);
        replies_[command] = reply;
    }
    // The command lines received since the last call ("\r" ends each one).
    std::vector<std::string> Sent() {
        std::lock_guard<std::mutex> lock(mutex_);
        std::vector<std::string> out;
        out.swap(sent_);
        return out;
    }
    using Lines = std::vector<std::string>;

    TempFolder temp_;
    SettingsStore settings_{temp_ / "settings.db"};
    std::mutex mutex_;
    std::vector<std::string> sent_;
    std::map<std::string, std::string> replies_;
    FakeCard card_;
    std::unique_ptr<Link> link_;
};

TEST_F(CommandsTest, NetworkSelection) {
    EXPECT_EQ(NetworkRegister(*link_, u"PANAFON"), 0);
    // A name standing twice in the table registers its first code.
    EXPECT_EQ(NetworkRegister(*link_, u"MOVISTAR"), 0);
    EXPECT_EQ(Sent(), (Lines{"AT+COPS=1,2,20205", "AT+COPS=1,2,21402"}));
    EXPECT_EQ(NetworkRegister(*link_, u"Nowhere Mobile"), -1);
    EXPECT_TRUE(Sent().empty());

    Answer("AT+COPS=1,2,20201", kError);
    EXPECT_EQ(NetworkRegister(*link_, u"COSMOTE"), 4);
    Answer("AT+COPS=1,2,20201", "\r\nBUSY\r\n");
    EXPECT_EQ(NetworkRegister(*link_, u"COSMOTE"), 7);  // passed on as the card said it

    EXPECT_EQ(NetworkAutomatic(*link_), 0);
    Answer("AT+COPS=0", kError);
    EXPECT_EQ(NetworkAutomatic(*link_), 4);

    Answer("AT+COPS?", "\r\n+COPS: 1,2,20205\r\n\r\nOK\r\n");
    EXPECT_EQ(NetworkMode(*link_), 1);
    char16_t name[kOperatorNameSize] = u"old";
    EXPECT_EQ(CurrentOperatorName(*link_, name, kOperatorNameSize), 1);
    EXPECT_EQ(std::u16string(name), u"PANAFON");
    // A modem's own alphanumeric name is shown as it is; no operator leaves the old text.
    Answer("AT+COPS?", "\r\n+COPS: 0,0,\"Vodafone UK\"\r\n\r\nOK\r\n");
    EXPECT_EQ(CurrentOperatorName(*link_, name, kOperatorNameSize), 1);
    EXPECT_EQ(std::u16string(name), u"Vodafone UK");
    Answer("AT+COPS?", "\r\n+COPS: 0\r\n\r\nOK\r\n");
    EXPECT_EQ(CurrentOperatorName(*link_, name, kOperatorNameSize), 0);
    EXPECT_EQ(std::u16string(name), u"Vodafone UK");
    Answer("AT+COPS?", kError);
    EXPECT_EQ(NetworkMode(*link_), -1);

    Answer("AT+COPS=?", "\r\n+COPS: 2,,,20201,3,,,20205,\r\n\r\nOK\r\n");
    OperatorName names[4];
    int count = -1;
    EXPECT_EQ(NetworkSearch(*link_, names, 4, &count), 1);
    ASSERT_EQ(count, 2);
    EXPECT_EQ(std::u16string(names[0]), u"COSMOTE");
    EXPECT_EQ(std::u16string(names[1]), u"PANAFON");
    Answer("AT+COPS=?", kError);
    EXPECT_EQ(NetworkSearch(*link_, names, 4, &count), -1);
    EXPECT_EQ(Sent(),
              (Lines{"AT+COPS=1,2,20201", "AT+COPS=1,2,20201", "AT+COPS=0", "AT+COPS=0", "AT+COPS?",
                     "AT+COPS?", "AT+COPS?", "AT+COPS?", "AT+COPS?", "AT+COPS=?", "AT+COPS=?"}));
}

TEST_F(CommandsTest, Forwarding) {
    EXPECT_EQ(ActivateForward(*link_, 1, kForwardNoReply, u"+447700900123", 30), 0);
    EXPECT_EQ(ActivateForward(*link_, 4, kForwardBusy, u"0123", 20), 0);
    EXPECT_EQ(EraseForward(*link_, 2, kForwardNotReachable), 0);
    for (int serviceClass : {1, 2, 4})
        EXPECT_EQ(DisableAllForwards(*link_, serviceClass), 0);
    EXPECT_EQ(DisableAllForwardsAllClasses(*link_), 0);
    EXPECT_EQ(Sent(),
              (Lines{"AT+CCFC=2,3,\"+447700900123\",145,1,,,30", "AT+CCFC=1,3,\"0123\",129,4,,,20",
                     "AT+CCFC=3,4,,,2", "AT+CCFC=4,0,,,1", "AT+CCFC=4,0,,,2", "AT+CCFC=4,0,,,4",
                     "AT+CCFC=4,0,,,7"}));

    // Classes outside 1..4 and reasons outside 0..3 never reach the card.
    char16_t number[32] = u"";
    EXPECT_EQ(QueryForward(*link_, 5, 0, number, 32), -1);
    EXPECT_EQ(QueryForward(*link_, 1, 4, number, 32), -1);
    EXPECT_EQ(ActivateForward(*link_, 0, 0, u"1", 20), -1);
    EXPECT_EQ(EraseForward(*link_, 1, -1), -1);
    EXPECT_EQ(DisableAllForwards(*link_, 3), -1);
    EXPECT_EQ(DisableAllForwards(*link_, 7), -1);
    EXPECT_TRUE(Sent().empty());

    Answer("AT+CCFC=0,2,,,4", "\r\n+CCFC: 1,4,\"0123\",129\r\n\r\nOK\r\n");
    EXPECT_EQ(QueryForward(*link_, 4, kForwardUnconditional, number, 32), 1);
    EXPECT_EQ(std::u16string(number), u"0123");
    Answer("AT+CCFC=0,2,,,4", "\r\n+CCFC: 0,4\r\n\r\nOK\r\n");
    EXPECT_EQ(QueryForward(*link_, 4, kForwardUnconditional, number, 32), 0);
    Answer("AT+CCFC=0,2,,,4", kError);
    EXPECT_EQ(QueryForward(*link_, 4, kForwardUnconditional, number, 32), -1);
    Answer("AT+CCFC=2,4,,,1", "\r\nBUSY\r\n");
    EXPECT_EQ(EraseForward(*link_, 1, kForwardNoReply), 7);
    Answer("AT+CCFC=4,0,,,7", kError);
    EXPECT_EQ(DisableAllForwardsAllClasses(*link_), 4);
}

TEST_F(CommandsTest, BarringAndCodes) {
    EXPECT_EQ(LockBarring(*link_, 2, 1, u"0000"), 0);
    EXPECT_EQ(UnlockBarring(*link_, 1, 6, u"0000"), 0);
    EXPECT_EQ(UnlockAllBarrings(*link_, u"1234"), 0);
    EXPECT_EQ(QueryBarring(*link_, 4, 4), 0);  // OK without "+CLCK:"
    EXPECT_EQ(QueryLock(*link_, 0), 0);
    EXPECT_EQ(SetLock(*link_, 2, 1, u"12345"), 0);
    EXPECT_EQ(SetLock(*link_, 0, 0, u"1234"), 0);
    EXPECT_EQ(ChangeCode(*link_, 1, u"5678", u"8765"), 0);
    EXPECT_EQ(ChangeCode(*link_, 3, u"0000", u"9999"), 0);
    EXPECT_EQ(Sent(),
              (Lines{"AT+CLCK=\"OI\",1,\"0000\",2", "AT+CLCK=\"AG\",0,\"0000\",1",
                     "AT+CLCK=\"AB\",0,\"1234\",7", "AT+CLCK=\"IR\",2", "AT+CLCK=\"SC\",2",
                     "AT+CLCK=\"PS\",1,\"12345\",7", "AT+CLCK=\"SC\",0,\"1234\",7",
                     "AT+CPWD=\"P2\",\"5678\",\"8765\",7", "AT+CPWD=\"AB\",\"0000\",\"9999\",7"}));

    // Out of range: locking and unlocking answer 0 as if done, the others -1; nothing is sent.
    EXPECT_EQ(LockBarring(*link_, 1, 5, u"0000"), 0);
    EXPECT_EQ(LockBarring(*link_, 7, 0, u"0000"), 0);
    EXPECT_EQ(UnlockBarring(*link_, 1, 4, u"0000"), 0);
    EXPECT_EQ(UnlockBarring(*link_, 0, 5, u"0000"), 0);
    EXPECT_EQ(QueryBarring(*link_, 1, 8), -1);
    EXPECT_EQ(QueryBarring(*link_, 7, 0), -1);
    EXPECT_EQ(QueryLock(*link_, 4), -1);
    EXPECT_EQ(SetLock(*link_, 0, 2, u"1234"), -1);
    EXPECT_EQ(SetLock(*link_, -1, 1, u"1234"), -1);
    EXPECT_EQ(ChangeCode(*link_, 4, u"1", u"2"), -1);
    EXPECT_TRUE(Sent().empty());

    Answer("AT+CLCK=\"AO\",2", "\r\n+CLCK: 1,7\r\n\r\nOK\r\n");
    for (int serviceClass : {1, 2, 4})
        EXPECT_EQ(QueryBarring(*link_, serviceClass, 0), 1);
    // A modem's line per class: fax barred after voice and data that are not.
    Answer("AT+CLCK=\"AO\",2", "\r\n+CLCK: 0,1\r\n+CLCK: 0,2\r\n+CLCK: 1,4\r\n\r\nOK\r\n");
    for (int serviceClass : {1, 2, 4})
        EXPECT_EQ(QueryBarring(*link_, serviceClass, 0), serviceClass == 4 ? 1 : 0);
    Answer("AT+CLCK=\"AO\",2", kError);
    EXPECT_EQ(QueryBarring(*link_, 1, 0), 4);  // a failure, not "not barred"
    Answer("AT+CLCK=\"OI\",1,\"1111\",1", "\r\n+CME ERROR: 16\r\n");
    CardError error;
    EXPECT_EQ(LockBarring(*link_, 1, 1, u"1111", &error), 4);  // a refusal, not a lost answer
    EXPECT_STREQ(CardErrorReason(error), "incorrect password");
    Answer("AT+CLCK=\"P2\",2", "\r\n+CLCK: 1\r\n\r\nOK\r\n");
    EXPECT_EQ(QueryLock(*link_, 1), 1);
    Answer("AT+CPWD=\"SC\",\"1\",\"2\",7", kError);
    EXPECT_EQ(ChangeCode(*link_, 0, u"1", u"2"), 4);
}

// What the card refuses with, whichever wrapper asked: the result is a failure (4) and the
// reason is the card's; an answer that is no refusal leaves no reason behind.
TEST_F(CommandsTest, CardRefusalsAreFailuresWithTheirReason) {
    struct Case {
        const char* command;
        std::function<int(CardError*)> call;
    };
    const Case cases[] = {
        {"AT+CCFC=1,4,,,1", [&](CardError* e) { return EraseForward(*link_, 1, 1, e); }},
        {"AT+CCFC=0,3,\"0123\",129,2,,,20",
         [&](CardError* e) { return ActivateForward(*link_, 2, 0, u"0123", 20, e); }},
        {"AT+CCFC=4,0,,,7", [&](CardError* e) { return DisableAllForwardsAllClasses(*link_, e); }},
        {"AT+CLCK=\"AO\",2", [&](CardError* e) { return QueryBarring(*link_, 1, 0, e); }},
        {"AT+CLCK=\"AB\",0,\"0000\",7",
         [&](CardError* e) { return UnlockAllBarrings(*link_, u"0000", e); }},
        {"AT+CLCK=\"SC\",2", [&](CardError* e) { return QueryLock(*link_, 0, e); }},
        {"AT+CLCK=\"SC\",1,\"1234\",7",
         [&](CardError* e) { return SetLock(*link_, 0, 1, u"1234", e); }},
        {"AT+CPWD=\"SC\",\"1234\",\"4321\",7",
         [&](CardError* e) { return ChangeCode(*link_, 0, u"1234", u"4321", e); }},
    };
    // Each wrapper meets one kind of refusal; the reading of every kind is the table below.
    const char* refusals[] = {"\r\n+CME ERROR: 12\r\n", "\r\n+CME ERROR: 16\r\n",
                              "\r\n+CMS ERROR: 311\r\n", "\r\n+CME ERROR: SIM busy\r\n"};
    int n = 0;
    for (const Case& c : cases) {
        const char* refusal = refusals[n++ % std::size(refusals)];
        Answer(c.command, refusal);
        CardError error;
        EXPECT_EQ(c.call(&error), 4) << c.command << " " << refusal;
        EXPECT_NE(error.kind, CardError::None) << c.command;
        Answer(c.command, kError);
        EXPECT_EQ(c.call(&error), 4) << c.command;
        EXPECT_EQ(error.kind, CardError::None) << c.command;
        Sent();
    }
}

TEST(CardErrorTest, ReplyResultAndReason) {
    struct Case {
        const char* reply;
        int result;
        const char* reason;
    };
    const Case cases[] = {
        {"\r\n+CME ERROR: 12\r\n", 4, "SIM PUK required"},
        {"\r\n+CME ERROR: 4\r\n", 4, "operation not supported"},
        {"\r\n+CME ERROR: 16\r\n", 4, "incorrect password"},
        {"\r\n+CME ERROR: incorrect password\r\n", 4, "incorrect password"},
        {"\r\n+CMS ERROR: 311\r\n", 4, "SIM PIN required"},
        {"\r\n+CME ERROR: 777\r\n", 4, "error reported by the card"},
        {"\r\n+CME ERROR: -3\r\n", 4, "-3"},
        {"\r\n+CME ERROR:\r\n", 4, ""},
        // Only a line that opens with the tag is a report; OK and ERROR keep their codes.
        {"\r\n+CCFC: 1,1,\"+CME ERROR: 12\",145\r\n\r\nOK\r\n", 0, ""},
        {"\r\nERROR\r\n", 4, ""},
        {"\r\nOK\r\n", 0, ""},
        {"\r\nBUSY\r\n", 7, ""},
        {"\r\n+CCFC: 0,1\r\n", -1, ""},
    };
    for (const Case& c : cases) {
        CardError error;
        error.kind = CardError::Message;  // stale: the reading must clear it
        EXPECT_EQ(SettingsResult(c.reply, static_cast<int>(std::strlen(c.reply)), &error), c.result)
            << c.reply;
        EXPECT_STREQ(CardErrorReason(error), c.reason) << c.reply;
    }
}

// A quote or a line end inside a code or number would end the command's field or the command
// itself early: such text never reaches the card.
TEST_F(CommandsTest, TextThatWouldBreakTheCommandIsNotSent) {
    for (const char16_t* text : {u"12\"4", u"\"", u"12\r4", u"1;\n"}) {
        EXPECT_EQ(LockBarring(*link_, 1, 0, text), -1);
        EXPECT_EQ(UnlockAllBarrings(*link_, text), -1);
        EXPECT_EQ(SetLock(*link_, 0, 1, text), -1);
        EXPECT_EQ(ChangeCode(*link_, 0, text, u"1234"), -1);
        EXPECT_EQ(ChangeCode(*link_, 0, u"1234", text), -1);
        EXPECT_EQ(ActivateForward(*link_, 1, 0, text, 20), -1);
    }
    EXPECT_TRUE(Sent().empty());
}

}  // namespace
}  // namespace vqm
