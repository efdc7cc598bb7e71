// vqm-phone's command line, the request and reply lines it exchanges with the dialer, the
// checks of its input, and the event feed it follows: everything that needs no card.
#include "tools/phone_commands.h"

#include <gtest/gtest.h>

#include <string>
#include <vector>

#include "link/link.h"
#include "messaging/message_store.h"
#include "messaging/write_sms.h"
#include "support/settings_store.h"
#include "support/text.h"
#include "tests/common/temp_folder.h"

namespace vqm::phone {
namespace {

struct ParseCase {
    std::vector<std::string> args;
    int code;
    Verb verb;
};

class PhoneCommandsTest : public ::testing::Test {
  protected:
    PhoneCommandsTest() {
        const std::string install = temp_ / "install/";
        SetSettingString(settings_, u"InstallPath",
                         std::u16string(install.begin(), install.end()).c_str());
    }
    testing::TempFolder temp_;
    SettingsStore settings_{temp_ / "settings.db"};
    Link link_{settings_, DriverRoots{temp_ / "run", temp_ / "tty"}};
};

TEST_F(PhoneCommandsTest, CommandLinesAreReadOrRefusedBeforeAnyCard) {
    const std::vector<ParseCase> cases = {
        {{"status"}, kExitDone, Verb::Status},
        {{"--json", "status"}, kExitDone, Verb::Status},
        {{"status", "now"}, kExitUsage, Verb::Status},
        {{"dial", "+441234567"}, kExitDone, Verb::Dial},
        {{"dial", "*#06#"}, kExitDone, Verb::Dial},
        {{"dial", "12a4"}, kExitUsage, Verb::Status},
        {{"dial", "12+4"}, kExitUsage, Verb::Status},
        {{"dial", "12345678901234567890"}, kExitUsage, Verb::Status},  // 20 characters
        {{"dial"}, kExitUsage, Verb::Status},
        {{"hangup"}, kExitDone, Verb::HangUp},
        {{"answer"}, kExitDone, Verb::Answer},
        {{"sms", "list"}, kExitDone, Verb::SmsList},
        {{"sms", "list", "--folder", "pc"}, kExitDone, Verb::SmsList},
        {{"sms", "list", "--folder", "trash"}, kExitUsage, Verb::Status},
        {{"sms", "list", "--folder"}, kExitUsage, Verb::Status},
        {{"sms", "read", "3"}, kExitDone, Verb::SmsRead},
        {{"sms", "read", "0"}, kExitUsage, Verb::Status},
        {{"sms", "read", "x"}, kExitUsage, Verb::Status},
        {{"sms", "delete", "2", "--folder", "sent"}, kExitDone, Verb::SmsDelete},
        {{"sms", "send", "+4477", "0123", "--text", "Hi"}, kExitDone, Verb::SmsSend},
        {{"sms", "send", "--text", "Hi"}, kExitUsage, Verb::Status},
        {{"sms", "send", "+4477"}, kExitUsage, Verb::Status},
        {{"sms", "send", "Bob", "--text", "Hi"}, kExitUsage, Verb::Status},
        {{"sms", "forward"}, kExitUsage, Verb::Status},
        {{"contacts", "list"}, kExitDone, Verb::ContactsList},
        {{"contacts", "list", "--desktop"}, kExitDone, Verb::ContactsList},
        {{"contacts", "list", "--sim", "--card"}, kExitUsage, Verb::Status},
        {{"contacts", "export", "--vcard", "a.vcf"}, kExitDone, Verb::ContactsExport},
        {{"contacts", "export"}, kExitUsage, Verb::Status},
        {{"contacts", "import", "--vcard", "a.vcf", "--card"}, kExitDone, Verb::ContactsImport},
        {{"contacts", "import", "--vcard", "a.vcf", "--desktop"}, kExitUsage, Verb::Status},
        {{"calllog"}, kExitDone, Verb::CallLog},
        {{"calllog", "dialed"}, kExitDone, Verb::CallLog},
        {{"calllog", "missed"}, kExitUsage, Verb::Status},
        {{"events"}, kExitDone, Verb::Events},
        {{}, kExitUsage, Verb::Status},
        {{"reboot"}, kExitUsage, Verb::Status},
        {{"status", "--verbose"}, kExitUsage, Verb::Status},
    };
    for (const ParseCase& c : cases) {
        Command command;
        std::string error;
        std::string line;
        for (const std::string& a : c.args)
            line += a + " ";
        EXPECT_EQ(ParseCommand(c.args, &command, &error), c.code) << line;
        if (c.code == kExitDone)
            EXPECT_EQ(command.verb, c.verb) << line;
        else
            EXPECT_FALSE(error.empty()) << line;
    }
}

TEST_F(PhoneCommandsTest, TheDialersCopyOfACommandIsTheSameCommand) {
    const std::vector<std::vector<std::string>> lines = {
        {"--json", "status"},
        {"dial", "*#06#"},
        {"sms", "read", "7", "--folder", "draft"},
        {"sms", "send", "+44 (20) 1234", "555", "--text", "two words\nand a line \\ end"},
        {"contacts", "import", "--vcard", "/tmp/x y.vcf", "--card"},
        {"contacts", "list", "--desktop", "--json"},
        {"calllog", "unanswered"},
    };
    for (const auto& args : lines) {
        Command first, again;
        std::string error;
        ASSERT_EQ(ParseCommand(args, &first, &error), kExitDone) << error;
        std::vector<std::string> decoded;
        ASSERT_TRUE(DecodeRequest(EncodeRequest(CommandArguments(first)), &decoded));
        ASSERT_EQ(ParseCommand(decoded, &again, &error), kExitDone) << error;
        EXPECT_EQ(CommandArguments(again), CommandArguments(first));
        EXPECT_EQ(again.text, first.text);
        EXPECT_EQ(again.numbers, first.numbers);
        EXPECT_EQ(again.json, first.json);
    }
}

TEST_F(PhoneCommandsTest, RequestAndReplyLinesCarryAnyTextAndRefuseDamage) {
    const std::vector<std::string> texts = {"",      " ",         "a b", "\\s", "line\nbreak\r\n",
                                            "\t:x:", "Grüße 日本"};
    for (const std::string& text : texts) {
        const std::string request = EncodeRequest({"x", text, ""});
        EXPECT_EQ(request.find_first_of("\n\r"), std::string::npos);
        std::vector<std::string> args;
        ASSERT_TRUE(DecodeRequest(request, &args)) << request;
        EXPECT_EQ(args, (std::vector<std::string>{"x", text, ""}));

        Result result{kExitRefused, text, text + "!"}, back;
        uint64_t cursor = 0;
        const std::string reply = EncodeReply(result, 42);
        EXPECT_EQ(reply.find_first_of("\n\r"), std::string::npos);
        ASSERT_TRUE(DecodeReply(reply, &back, &cursor)) << reply;
        EXPECT_EQ(back.code, kExitRefused);
        EXPECT_EQ(back.out, text);
        EXPECT_EQ(back.err, text + "!");
        EXPECT_EQ(cursor, 42u);
    }
    std::vector<std::string> args;
    Result result;
    for (const char* bad : {"", "1", "273 40001 0", "PHONE :a\\q", "PHONE a", "PHONEX :a"})
        EXPECT_FALSE(DecodeRequest(bad, &args)) << bad;
    for (const char* bad : {"0", "PHONE 0 :a :b", "PHONE x :a :b 0", "PHONE 0 a :b 0",
                            "PHONE 0 :a :b -1", "PHONE 0 :a\\ :b 0"})
        EXPECT_FALSE(DecodeReply(bad, &result)) << bad;
}

TEST_F(PhoneCommandsTest, MessageTextsAreCheckedAndCodedAsTheWriteViewSendsThem) {
    struct TextCase {
        std::string text;
        int code;
        int coding;  // 0 7-bit, 8 UCS2
    };
    const std::vector<TextCase> cases = {
        {"Hello", kExitDone, 0},
        {std::string(160, 'a'), kExitDone, 0},
        {std::string(161, 'a'), kExitUsage, 0},
        {"Grüße", kExitDone, 0},                                // ü and ß are in the GSM alphabet
        {"price 5\xE2\x82\xAC", kExitDone, 8},                  // the euro sign needs UCS2 here
        {"\xE6\x97\xA5" + std::string(69, 'a'), kExitDone, 8},  // 70 units
        {"\xE6\x97\xA5" + std::string(70, 'a'), kExitUsage, 8},
        {"two\r\nlines", kExitDone, 0},
        {std::string(159, 'a') + "\r\n", kExitUsage, 0},  // the view would offer to cut it
        {"", kExitUsage, 0},
        {std::string(kMaxTextBytes + 1, 'a'), kExitUsage, 0},
    };
    for (const TextCase& c : cases) {
        SCOPED_TRACE(c.text.substr(0, 20));
        SmsRecord body{};
        std::string error;
        ASSERT_EQ(CheckMessageText(c.text, &body, &error), c.code);
        if (c.code != kExitDone) {
            EXPECT_FALSE(error.empty());
            continue;
        }
        EXPECT_EQ(body.coding, c.coding);
        // What vqm-phone sends is what the Write SMS view sends for the same text.
        PreparedSend view;
        ASSERT_TRUE(PrepareSend(u"12345", Utf8ToUtf16(c.text), {}, &view));
        EXPECT_EQ(body.coding, view.body.coding);
        EXPECT_EQ(body.length, view.body.length);
        EXPECT_EQ(std::string(body.text, sizeof body.text),
                  std::string(view.body.text, sizeof view.body.text));
    }
    // Refused texts name their limit.
    std::string error;
    SmsRecord body{};
    CheckMessageText("\xE6\x97\xA5" + std::string(70, 'a'), &body, &error);
    EXPECT_NE(error.find("71 characters, at most 70"), std::string::npos) << error;
}

TEST_F(PhoneCommandsTest, RecipientNumbersAreFilteredAsTheWriteViewDoes) {
    const std::vector<std::pair<std::string, std::string>> cases = {
        {"+447700900123", "+447700900123"},
        {"+44 (20) 1234 5678", "+44+2012345678"},  // '(' gives a second '+'
        {"0123-456", "0123456"},
        {"*100#", "*100#"},
        {"Bob", ""},
        {"", ""},
        {"123456789012345678901", ""},  // 21 digits
    };
    for (const auto& [given, expected] : cases)
        EXPECT_EQ(RecipientNumber(given), expected) << given;
}

TEST_F(PhoneCommandsTest, OnlyTheComputersOwnFilesRunWithoutTheCard) {
    const std::vector<std::pair<std::vector<std::string>, bool>> cases = {
        {{"calllog"}, false},
        {{"contacts", "list", "--desktop"}, false},
        {{"contacts", "list"}, true},
        {{"sms", "list", "--folder", "sent"}, false},
        {{"sms", "delete", "1", "--folder", "pc"}, false},
        {{"sms", "list"}, true},
        {{"sms", "read", "1", "--folder", "outbox"}, true},
        {{"status"}, true},
    };
    for (const auto& [args, needs] : cases) {
        Command command;
        std::string error;
        ASSERT_EQ(ParseCommand(args, &command, &error), kExitDone);
        EXPECT_EQ(NeedsCard(command), needs) << args[0];
    }
}

TEST_F(PhoneCommandsTest, ImportFilesAreCheckedBeforeTheCard) {
    const std::string small = temp_ / "one.vcf", big = temp_ / "big.vcf";
    std::FILE* file = std::fopen(small.c_str(), "w");
    std::fputs("BEGIN:VCARD\nVERSION:3.0\nFN:Ann\nTEL:123\nEND:VCARD\n", file);
    std::fclose(file);
    file = std::fopen(big.c_str(), "w");
    std::fseek(file, kMaxVCardFileBytes, SEEK_SET);
    std::fputc('x', file);
    std::fclose(file);
    for (const auto& [path, code] : std::vector<std::pair<std::string, int>>{
             {small, kExitDone}, {big, kExitUsage}, {temp_ / "missing.vcf", kExitUsage}}) {
        Command command;
        std::string error;
        ASSERT_EQ(ParseCommand({"contacts", "import", "--vcard", path}, &command, &error),
                  kExitDone);
        EXPECT_EQ(CheckInputs(command, &error), code) << path;
    }
}

// A sink standing for the dialer's own: counts what it was handed.
struct CountingSink : EventSink {
    int UnsolicitedScan(const char*, int) override { return ++scans; }
    int QueueLine(const char*, int) override { return ++lines; }
    int DispatchAll(int*) override { return ++dispatches; }
    int scans = 0, lines = 0, dispatches = 0;
};

TEST_F(PhoneCommandsTest, TheEventFeedReadsEachCodeAndHandsEverythingOn) {
    CountingSink dialer;
    EventFeed feed(link_, &dialer);
    link_.firmwareVersion = 4.0f;
    const std::vector<std::pair<std::string, std::string>> lines = {
        {"+CRING: VOICE", "ring"},
        {"+CLIP: \"+4412345\",145", "caller +4412345"},
        {"+CLIP: \"4412345\",145,,,,0", "caller +4412345"},  // a standard modem's form
        {"+CMTI: \"SM\",12", "message 12"},
        {"+CMTI: \"SM\",", ""},  // no location: nothing to tell
        {"^RSSI: 3", ""},
        {"+CREG: 1", ""},
    };
    uint64_t cursor = feed.Last();
    for (const auto& [line, shown] : lines) {
        const int handedOn = feed.QueueLine(line.data(), static_cast<int>(line.size()));
        EXPECT_EQ(handedOn, dialer.lines);  // the dialer's own answer comes back
        uint64_t last = 0;
        std::string text;
        for (const Event& event : feed.Since(cursor, &last))
            text += FormatEvent(event, false);
        EXPECT_EQ(text, shown.empty() ? "" : shown + "\n") << line;
        cursor = last;
    }
    EXPECT_EQ(dialer.lines, static_cast<int>(lines.size()));

    // The listener's stand-in ring comes as a whole reply.
    const char reply[] = "\r\n+CRING: VOICE\r\n\r\nOK\r\n";
    feed.UnsolicitedScan(reply, sizeof reply - 1);
    feed.DispatchAll(nullptr);
    EXPECT_EQ(dialer.scans, 1);
    EXPECT_EQ(dialer.dispatches, 1);
    uint64_t last = 0;
    const std::vector<Event> rings = feed.Since(cursor, &last);
    ASSERT_EQ(rings.size(), 1u);
    EXPECT_EQ(FormatEvent(rings[0], true), "{\"event\":\"ring\"}\n");
}

TEST_F(PhoneCommandsTest, TheEventFeedKeepsTheNewestAndWaitsBounded) {
    EventFeed feed(link_);  // no sink behind it, as in vqm-phone itself
    EXPECT_FALSE(feed.WaitAfter(0, 20));
    const std::string line = "+CMTI: \"SM\",3";
    for (int i = 0; i < 250; ++i)
        feed.QueueLine(line.data(), static_cast<int>(line.size()));
    EXPECT_TRUE(feed.WaitAfter(249, 0));
    uint64_t last = 0;
    const std::vector<Event> kept = feed.Since(0, &last);
    EXPECT_EQ(last, 250u);
    ASSERT_EQ(kept.size(), 200u);
    EXPECT_EQ(kept.front().sequence, 51u);
    EXPECT_EQ(FormatEvent(kept.back(), true), "{\"event\":\"message\",\"index\":3}\n");
    EXPECT_TRUE(feed.Since(250, &last).empty());
}

TEST_F(PhoneCommandsTest, TheDialerRefusesCardCommandsWithoutItsCard) {
    Context context(link_, settings_);
    EventFeed feed(link_);
    struct RequestCase {
        std::vector<std::string> args;
        int code;
    };
    const std::vector<RequestCase> cases = {
        {{"status"}, kExitNoCard},
        {{"events"}, kExitUsage},
        {{"dial", "12x"}, kExitUsage},
        {{"calllog", "--json"}, kExitDone},  // the computer's own file
        {{"events-since", "now"}, kExitDone},
    };
    for (const RequestCase& c : cases) {
        Result result;
        ASSERT_TRUE(DecodeReply(AnswerRequest(context, &feed, EncodeRequest(c.args)), &result));
        EXPECT_EQ(result.code, c.code) << c.args[0];
    }
    Result result;
    ASSERT_TRUE(DecodeReply(AnswerRequest(context, &feed, "PHONE :a\\q"), &result));
    EXPECT_EQ(result.code, kExitUsage);
}

}  // namespace
}  // namespace vqm::phone
