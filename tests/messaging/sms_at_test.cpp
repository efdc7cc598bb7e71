// The message commands against the simulated card over a real pseudo-terminal, and against a
// scripted card for the replies the simulated one never gives.
#include <gtest/gtest.h>

#include <chrono>
#include <cstring>
#include <memory>
#include <mutex>
#include <regex>
#include <string>
#include <thread>
#include <vector>

#include "cardsim/card_sim.h"
#include "link/link.h"
#include "messaging/sms_at.h"
#include "support/gsm.h"
#include "support/settings_store.h"
#include "tests/common/fake_card.h"
#include "tests/common/temp_folder.h"

namespace vqm {
namespace {

// Keeps every text the link hands over, so a test can see the unsolicited codes in it.
class RecordingSink : public EventSink {
  public:
    int UnsolicitedScan(const char* text, int length) override {
        std::lock_guard<std::mutex> lock(mutex_);
        seen_.append(text, static_cast<size_t>(length));
        return 0;
    }
    int QueueLine(const char* line, int length) override {
        std::lock_guard<std::mutex> lock(mutex_);
        seen_.append(line, static_cast<size_t>(length));
        seen_ += "\r\n";
        return 0;
    }
    int DispatchAll(int*) override { return 0; }
    bool Saw(const std::string& text) {
        std::lock_guard<std::mutex> lock(mutex_);
        return seen_.find(text) != std::string::npos;
    }

  private:
    std::mutex mutex_;
    std::string seen_;
};

SmsRecord Message(const char* number, const char* text) {
    SmsRecord record{};
    std::snprintf(record.number, sizeof record.number, "%s", number);
    std::snprintf(record.text, sizeof record.text, "%s", text);
    record.length = static_cast<int32_t>(std::strlen(text));
    return record;
}

SmsRecord Ucs2Message(const char* number, const std::u16string& text) {
    SmsRecord record{};
    std::snprintf(record.number, sizeof record.number, "%s", number);
    record.coding = 8;
    record.length = TextToUcs2Hex(text.data(), text.size() * 2, record.text, sizeof record.text);
    return record;
}

class SmsAtTest : public ::testing::Test {
  protected:
    SmsAtTest() {
        cardsim::SimConfig config;
        config.baud = 0;
        config.runtimeDir = temp_ / "run";
        config.stateFile = temp_ / "card.state";  // none yet: the card starts as the demo SIM
        sim_ = std::make_unique<cardsim::CardSim>(config);
        link_.events = &sink_;
        if (sim_->PowerUp()) opened_ = PortOpenDevice(link_, sim_->DevicePath().c_str());
    }
    ~SmsAtTest() override { PortClose(link_); }

    void SetUp() override { ASSERT_EQ(opened_, 1); }

    SmsRecord Read(int index, int mode = kSmsModePdu, int* result = nullptr) {
        SmsRecord record{};
        record.index = index;
        const int ok = SmsRead(link_, mode, &record);
        if (result) *result = ok;
        return record;
    }

    // The listener drains what the card sends on its own once a second; a command of the
    // test's own could take the code's first bytes as its echo.
    bool WaitFor(const std::string& text) {
        for (int i = 0; i < 500 && !sink_.Saw(text); ++i)
            std::this_thread::sleep_for(std::chrono::milliseconds(20));
        return sink_.Saw(text);
    }

    const testing::TempFolder temp_;
    SettingsStore settings_{temp_ / "settings.db"};
    RecordingSink sink_;
    Link link_{settings_, DriverRoots{temp_ / "run", temp_ / "tty"}};
    std::unique_ptr<cardsim::CardSim> sim_;
    int opened_ = 0;
};

TEST_F(SmsAtTest, WriteReadSendStoredAndDelete) {
    ASSERT_EQ(SmsSetFormat(link_, kSmsModePdu), 0);
    int32_t used = -1, total = -1;
    ASSERT_EQ(SmsSelectSimStorage(link_, &used, &total), 1);
    EXPECT_GT(total, used);

    // '@' is GSM code 0, which the read shows as a blank.
    SmsRecord plain = Message("+4412", "Back @ 5, bring the keys");
    ASSERT_EQ(SmsWrite(link_, kSmsModePdu, &plain), 1);
    EXPECT_STREQ(plain.status, "STO UNSENT");
    SmsRecord wide = Ucs2Message("12345", u"Ωραία, τα λέμε");
    ASSERT_EQ(SmsWrite(link_, kSmsModePdu, &wide), 1);
    EXPECT_EQ(wide.index, plain.index + 1);
    EXPECT_EQ(SmsStorageUsed(link_), used + 2);

    const SmsRecord back = Read(plain.index);
    EXPECT_STREQ(back.number, "+4412");
    EXPECT_STREQ(back.status, "STO UNSENT");
    EXPECT_STREQ(back.date, "");
    EXPECT_EQ(back.coding, 0);
    EXPECT_EQ(std::string(back.text, back.length), "Back   5, bring the keys");
    const SmsRecord wideBack = Read(wide.index);
    EXPECT_STREQ(wideBack.number, "12345");
    EXPECT_EQ(wideBack.coding, 8);
    EXPECT_EQ(wideBack.length, wide.length);
    EXPECT_STREQ(wideBack.text, wide.text);

    // A stored message goes out once; it is then a sent one, which the read leaves unnamed.
    EXPECT_EQ(SmsSendStored(link_, plain.index), 1);
    EXPECT_STREQ(Read(plain.index).status, "");
    EXPECT_EQ(SmsSendStored(link_, 1), 0);  // a received message cannot be sent
    EXPECT_EQ(SmsSendStored(link_, 200), 0);

    EXPECT_EQ(SmsDelete(link_, plain.index), 0);
    int result = -1;
    Read(plain.index, kSmsModePdu, &result);
    EXPECT_EQ(result, 0);
    EXPECT_EQ(SmsStorageUsed(link_), used + 1);
    EXPECT_NE(SmsDelete(link_, 0), 0);  // "+CMS ERROR: 321" is no "OK"
}

TEST_F(SmsAtTest, SendUsesTheCentreAndItsParameter) {
    char16_t centre[40] = u"unchanged";
    int32_t validity = -5;
    ASSERT_EQ(SmsGetCentre(link_, centre, 40, &validity), 1);
    EXPECT_EQ(std::u16string(centre), u"+3097100000");
    EXPECT_EQ(validity, 167);

    SmsRecord message = Message("+447700900123", "On my way");
    message.index = 9;
    ASSERT_EQ(SmsSend(link_, kSmsModePdu, &message), 1);
    EXPECT_STREQ(message.status, "STO SENT");
    EXPECT_EQ(message.index, 9);  // sending does not store
    SmsRecord longest = Message("+447700900123", std::string(160, 'x').c_str());
    EXPECT_EQ(SmsSend(link_, kSmsModePdu, &longest), 1);
    SmsRecord widest = Ucs2Message("+447700900123", std::u16string(70, u'Ж'));
    EXPECT_EQ(SmsSend(link_, kSmsModePdu, &widest), 1);

    // The single parameter lands in <fo>; the read takes <vp>, which stays as it was.
    ASSERT_EQ(SmsSetCentre(link_, u"+441234", 173), 1);
    ASSERT_EQ(SmsGetCentre(link_, centre, 40, &validity), 1);
    EXPECT_EQ(std::u16string(centre), u"+441234");
    EXPECT_EQ(validity, 167);

    // An empty number gives the card back the centre its SIM holds ("Use SIM Default").
    ASSERT_EQ(SmsSetCentre(link_, u"", 17), 1);
    ASSERT_EQ(SmsGetCentre(link_, centre, 40, &validity), 1);
    EXPECT_EQ(std::u16string(centre), u"+3097100000");
    EXPECT_EQ(SmsSend(link_, kSmsModePdu, &message), 1);
    EXPECT_EQ(SmsSetCentre(link_, u"12ab", 17), 0);
}

TEST_F(SmsAtTest, FullMemoryRefusesWritesAndDeliveries) {
    int32_t used = 0, total = 0;
    ASSERT_EQ(SmsSelectSimStorage(link_, &used, &total), 1);
    ASSERT_EQ(sim_->Control("capacity " + std::to_string(used + 1)), "OK");
    EXPECT_EQ(SmsStorageFull(link_), 0);
    SmsRecord message = Message("12345", "last one in");
    ASSERT_EQ(SmsWrite(link_, kSmsModePdu, &message), 1);
    EXPECT_EQ(SmsStorageFull(link_), 1);

    SmsRecord refused = Message("12345", "no room");
    EXPECT_EQ(SmsWrite(link_, kSmsModePdu, &refused), 0);
    EXPECT_EQ(refused.index, 0);
    EXPECT_EQ(sim_->Control("deliver +4412 no room either"), "ERROR: SIM message memory full");
    EXPECT_NE(sim_->Control("capacity " + std::to_string(used)), "OK");  // one stands above it

    ASSERT_EQ(SmsDelete(link_, message.index), 0);
    EXPECT_EQ(SmsStorageFull(link_), 0);
    EXPECT_EQ(sim_->Control("deliver +4412 now there is room"), "OK");
    EXPECT_EQ(SmsStorageFull(link_), 1);
}

TEST_F(SmsAtTest, DeliveredMessagesAreAnnouncedAndReadable) {
    int32_t used = 0, total = 0;
    ASSERT_EQ(SmsSelectSimStorage(link_, &used, &total), 1);
    ASSERT_EQ(sim_->Control("deliver +447700900123 Train at 18:05, platform 4"), "OK");
    const int index = used + 1;
    ASSERT_TRUE(WaitFor("+CMTI: \"SM\"," + std::to_string(index)));

    SmsRecord first = Read(index);
    EXPECT_STREQ(first.status, "REC UNREAD");
    EXPECT_STREQ(first.number, "+447700900123");
    EXPECT_EQ(std::string(first.text, first.length), "Train at 18:05, platform 4");
    EXPECT_TRUE(std::regex_match(first.date, std::regex(R"(\d\d:\d\d:\d\d,\d\d/\d\d/20\d\d)")))
        << first.date;
    EXPECT_STREQ(Read(index).status, "REC READ");  // the card marks it read

    ASSERT_EQ(sim_->Control("deliver 2101234567 Καλή αντάμωση"), "OK");
    ASSERT_TRUE(WaitFor("+CMTI: \"SM\"," + std::to_string(index + 1)));
    const SmsRecord greek = Read(index + 1);
    EXPECT_STREQ(greek.number, "2101234567");
    EXPECT_EQ(greek.coding, 8);
    EXPECT_STREQ(greek.text, Ucs2Message("", u"Καλή αντάμωση").text);

    // A raw PDU: no centre, a national sender, 8-bit data.
    ASSERT_EQ(sim_->Control("deliver-pdu 000405812143F5000420301141526300020102"), "OK");
    ASSERT_TRUE(WaitFor("+CMTI: \"SM\"," + std::to_string(index + 2)));
    const SmsRecord data = Read(index + 2);
    EXPECT_STREQ(data.number, "12345");
    EXPECT_STREQ(data.date, "14:25:36,11/03/2002");
    EXPECT_EQ(std::string(data.text, data.length), "DATA MESSAGE");
    EXPECT_NE(sim_->Control("deliver-pdu 0011000581"), "OK");
}

TEST_F(SmsAtTest, TextModeFormsAndTheFormatSwitch) {
    EXPECT_EQ(SmsGetFormat(link_), 0);
    ASSERT_EQ(SmsSetFormat(link_, kSmsModeText), 0);
    EXPECT_EQ(SmsGetFormat(link_), 1);
    EXPECT_EQ(SmsSetFormat(link_, 7), 4);
    EXPECT_EQ(SmsSetCharset(link_, "8859-1"), 0);

    // The first demo message came in on 11/03/2002 at 14:25:36.
    int result = 0;
    const SmsRecord received = Read(1, kSmsModeText, &result);
    ASSERT_EQ(result, 1);
    EXPECT_STREQ(received.status, "REC READ");
    EXPECT_STREQ(received.date, "14:25:36,11/03/2002");
    EXPECT_EQ(std::string(received.text, 7), "Welcome");

    SmsRecord note = Message("+4412", "Text mode note");
    ASSERT_EQ(SmsWrite(link_, kSmsModeText, &note), 1);
    const SmsRecord back = Read(note.index, kSmsModeText, &result);
    ASSERT_EQ(result, 1);
    EXPECT_STREQ(back.status, "STO UNSENT");
    EXPECT_STREQ(back.number, "+4412");
    EXPECT_EQ(std::string(back.text, 14), "Text mode note");
    EXPECT_EQ(SmsSend(link_, kSmsModeText, &note), 1);
    EXPECT_STREQ(note.status, "STO SENT");

    // Other modes send nothing and fail.
    SmsRecord other = Message("+4412", "x");
    EXPECT_EQ(SmsWrite(link_, 2, &other), 0);
    EXPECT_EQ(SmsSend(link_, -1, &other), 0);
    EXPECT_EQ(Read(1, 5, &result).status[0], '\0');
    EXPECT_EQ(result, 0);
}

// A card whose replies the test sets, recording each command as it arrived.
class ScriptedSmsTest : public ::testing::Test {
  protected:
    ScriptedSmsTest() {
        link_.events = nullptr;
        opened_ = PortOpenDevice(link_, card_.Device().c_str());
    }
    ~ScriptedSmsTest() override { PortClose(link_); }
    void SetUp() override { ASSERT_EQ(opened_, 1); }

    void Answer(const std::string& prefix, const std::string& reply) {
        std::lock_guard<std::mutex> lock(mutex_);
        answers_.emplace_back(prefix, reply);
        commands_.clear();
    }
    std::vector<std::string> Commands() {
        std::lock_guard<std::mutex> lock(mutex_);
        std::vector<std::string> mine;
        for (const std::string& c : commands_)
            if (c != "AT+CLCC") mine.push_back(c);  // the listener's polls
        return mine;
    }

    std::string Respond(const std::string& command) {
        std::lock_guard<std::mutex> lock(mutex_);
        commands_.push_back(command);
        for (auto it = answers_.rbegin(); it != answers_.rend(); ++it)
            if (command.compare(0, it->first.size(), it->first) == 0) return it->second;
        return "\r\nOK\r\n";
    }

    std::mutex mutex_;
    std::vector<std::pair<std::string, std::string>> answers_;
    std::vector<std::string> commands_;
    testing::FakeCard card_{[this](const std::string& command) { return Respond(command); }};
    const testing::TempFolder temp_;
    SettingsStore settings_{temp_ / "settings.db"};
    Link link_{settings_, DriverRoots{temp_ / "run", temp_ / "tty"}};
    int opened_ = 0;
};

TEST_F(ScriptedSmsTest, CentreAndParameterReplies) {
    char16_t centre[40] = u"kept";
    int32_t validity = -5;
    Answer("AT+CSCA?", "\r\nOK\r\n");
    Answer("AT+CSMP?", "\r\n+CSMP: 17,167,0,0\r\n\r\nOK\r\n");
    ASSERT_EQ(SmsGetCentre(link_, centre, 40, &validity), 1);
    EXPECT_EQ(std::u16string(centre), u"kept");  // no "+CSCA:" leaves it
    EXPECT_EQ(validity, 167);
    EXPECT_EQ(Commands(), (std::vector<std::string>{"AT+CSCA?", "AT+CSMP?"}));

    Answer("AT+CSCA?", "\r\n+CSCA: \"\",129\r\n\r\nOK\r\n");
    Answer("AT+CSMP?", "\r\n+CSMP: 17\r\n\r\nOK\r\n");
    ASSERT_EQ(SmsGetCentre(link_, centre, 40, &validity), 1);
    EXPECT_EQ(std::u16string(centre), u"");
    EXPECT_EQ(validity, 0);

    validity = 33;
    Answer("AT+CSMP?", "\r\nOK\r\n");
    ASSERT_EQ(SmsGetCentre(link_, centre, 40, &validity), 1);
    EXPECT_EQ(validity, 33);

    Answer("AT+CSCA=", "\r\n+CME ERROR: 3\r\n");
    EXPECT_EQ(SmsSetCentre(link_, u"+30971", 167), 0);
    EXPECT_EQ(Commands(), (std::vector<std::string>{"AT+CSCA=\"+30971\""}));
    Answer("AT+CSCA=", "\r\nOK\r\n");
    Answer("AT+CSMP=", "\r\nERROR\r\n");
    EXPECT_EQ(SmsSetCentre(link_, u"+30971", 167), 0);
    EXPECT_EQ(Commands(), (std::vector<std::string>{"AT+CSCA=\"+30971\"", "AT+CSMP=167"}));
}

TEST_F(ScriptedSmsTest, StorageReplies) {
    Answer("AT+CPMS?", "\"SM\",3,10,\"SM\",3,10\r\nOK\r\n");
    EXPECT_EQ(SmsStorageUsed(link_), -1);  // the memory name at the very start
    Answer("AT+CPMS?", "\r\n+CPMS: \"SM\",3,10,\"SM\",3,10,\"SM\",3,10\r\n\r\nOK\r\n");
    EXPECT_EQ(SmsStorageUsed(link_), 3);
    Answer("AT+CPMS=", "\r\n+CPMS: 10 10\r\n\r\nOK\r\n");
    EXPECT_EQ(SmsStorageFull(link_), 0);  // a malformed count is no full memory
    int32_t used = -1, total = -1;
    EXPECT_EQ(SmsSelectSimStorage(link_, &used, &total), 0);
    Answer("AT+CPMS=", "\r\n+CPMS: 10,10,10,10,10,10\r\n\r\nOK\r\n");
    EXPECT_EQ(SmsStorageFull(link_), 1);
    EXPECT_EQ(Commands().back(), "AT+CPMS=\"SM\",\"SM\",\"SM\"");
}

TEST_F(ScriptedSmsTest, CommandTexts) {
    Answer("AT", "\r\nOK\r\n");
    Answer("AT+CMGW=", "\r\n> ");
    SmsRecord record{};
    record.index = 3;
    SmsRead(link_, kSmsModePdu, &record);
    SmsRead(link_, kSmsModeText, &record);
    SmsGetFormat(link_);
    SmsSetFormat(link_, 0);
    SmsSetCharset(link_, "8859-1");
    SmsStorageUsed(link_);
    SmsRecord message = Message("+4412", "x");
    SmsWrite(link_, kSmsModeText, &message);
    EXPECT_EQ(Commands(), (std::vector<std::string>{"AT+CMGR=3", "AT+CMGR=3", "AT+CMGF?",
                                                    "AT+CMGF=0", "AT+CSCS=\"8859-1\"", "AT+CPMS?",
                                                    "AT+CMGW=\"+4412\"", "x"}));
}

TEST_F(ScriptedSmsTest, PromptAndConfirmation) {
    SmsRecord message = Message("+4412", "");
    // No prompt: the body is never sent.
    Answer("AT+CMGW=", "\r\nERROR\r\n");
    EXPECT_EQ(SmsWrite(link_, kSmsModePdu, &message), 0);
    EXPECT_EQ(Commands(), (std::vector<std::string>{"AT+CMGW=10,2"}));

    // A prompt but no confirmation.
    Answer("AT+CMGW=", "\r\n> ");
    EXPECT_EQ(SmsWrite(link_, kSmsModePdu, &message), 0);
    EXPECT_EQ(Commands(), (std::vector<std::string>{"AT+CMGW=10,2",
                                                    "00110004914421"
                                                    "0000A7"
                                                    "00"}));
    Answer("0011", "\r\n+CMGW: 12\r\n\r\nOK\r\n");
    std::snprintf(message.date, sizeof message.date, "old");
    ASSERT_EQ(SmsWrite(link_, kSmsModePdu, &message), 1);
    EXPECT_EQ(message.index, 12);
    EXPECT_STREQ(message.date, "");

    Answer("AT+CMGS=", "\r\n> ");
    EXPECT_EQ(SmsSend(link_, kSmsModePdu, &message), 0);  // "+CMGW:" is no "+CMGS:"
    Answer("0011", "\r\n+CMGS: 4\r\n\r\nOK\r\n");
    EXPECT_EQ(SmsSend(link_, kSmsModePdu, &message), 1);
    EXPECT_EQ(Commands().front(), "AT+CMGS=10");

    // Text mode: the body goes in the GSM alphabet, the type of address by the '+'.
    Answer("AT+CMGS=", "\r\n> ");
    Answer("hi", "\r\n+CMGS: 5\r\n\r\nOK\r\n");
    SmsRecord international = Message("+4412", "hi");
    EXPECT_EQ(SmsSend(link_, kSmsModeText, &international), 1);
    EXPECT_EQ(Commands(), (std::vector<std::string>{"AT+CMGS=\"+4412\",145", "hi"}));
    SmsRecord national = Message("4412", "hi");
    EXPECT_EQ(SmsSend(link_, kSmsModeText, &national), 1);
    EXPECT_EQ(Commands().at(2), "AT+CMGS=\"4412\",129");

    Answer("AT+CMSS=", "\r\n+CMSS: 5\r\n\r\nOK\r\n");
    EXPECT_EQ(SmsSendStored(link_, 7), 1);
    EXPECT_EQ(Commands(), (std::vector<std::string>{"AT+CMSS=7"}));
    Answer("AT+CMGD=", "\r\nOK\r\n");
    EXPECT_EQ(SmsDelete(link_, 7), 0);
    Answer("AT+CMGD=", "\r\nERROR\r\n");
    EXPECT_EQ(SmsDelete(link_, 7), 4);
    EXPECT_EQ(Commands(), (std::vector<std::string>{"AT+CMGD=7"}));

    // Modes other than 0 and 1 send nothing.
    Answer("AT", "\r\nOK\r\n");
    SmsRecord record{};
    EXPECT_EQ(SmsRead(link_, 3, &record), 0);
    EXPECT_EQ(SmsWrite(link_, 3, &record), 0);
    EXPECT_EQ(SmsSend(link_, 3, &record), 0);
    EXPECT_TRUE(Commands().empty());
}

}  // namespace
}  // namespace vqm
