#include "link/device_at.h"

#include <gtest/gtest.h>

#include <random>

#include <atomic>
#include <chrono>
#include <cstring>
#include <map>
#include <memory>
#include <mutex>
#include <string>
#include <thread>
#include <vector>

#include "link/link.h"
#include "support/settings_store.h"
#include "tests/common/fake_card.h"
#include "tests/common/link_waits.h"
#include "tests/common/temp_folder.h"
#include "tests/common/wait.h"

namespace vqm {
namespace {

// Where a reply comes from: the card's own dialect, or a plain 27.007 modem (USB sticks, phone
// modules, simulators). Rows of the second kind include layouts the card's reading never meets.
enum Source { kCard, kStandard, kDamaged };

const char* SourceName(Source source) {
    return source == kCard ? "card" : source == kStandard ? "standard" : "damaged";
}

std::string Ok(const std::string& info = "") {
    return (info.empty() ? "" : "\r\n" + info + "\r\n") + "\r\nOK\r\n";
}

// The reply's exact bytes in a buffer of their own size: no terminator to lean on.
struct Bytes {
    explicit Bytes(const std::string& text) : data(text.begin(), text.end()) {}
    const char* text() const { return data.data(); }
    int length() const { return static_cast<int>(data.size()); }
    std::vector<char> data;
};

struct FirmwareRow {
    Source source;
    std::string reply;
    float version;
    const char* line;
};

TEST(DeviceReplies, Firmware) {
    const FirmwareRow rows[] = {
        {kCard, Ok("SW4.00"), 4.00f, "SW4.00"},
        {kCard, Ok("SW3.80"), 3.80f, "SW3.80"},
        {kCard, "\r\nSW2.01 build 7\r\n", 2.01f, "SW2.01 build 7"},
        {kStandard, Ok("REV1"), 0.0f, "REV1"},
        {kStandard, Ok("+CGMR: \"1.0.2\""), 0.0f, "+CGMR: \"1.0.2\""},
        {kStandard, Ok("Revision: 12.1 SW7.5"), 7.5f, "Revision: 12.1 SW7.5"},
        {kDamaged, Ok("SWx"), 0.0f, "SWx"},
        {kDamaged, "\r\nSW", 0.0f, "SW"},
        {kDamaged, "\r\n\r\n", 0.0f, ""},
        {kDamaged, "", 0.0f, ""},
    };
    for (const FirmwareRow& row : rows) {
        const Bytes reply(row.reply);
        EXPECT_FLOAT_EQ(ParseFirmwareReply(reply.text(), reply.length()), row.version)
            << SourceName(row.source) << " " << row.reply;
        char line[64];
        const int n = ParseIdentityReply(reply.text(), reply.length(), line, sizeof line);
        EXPECT_EQ(std::string(line, n), row.line);
    }
    // A line longer than the buffer is cut to it.
    const Bytes longLine(Ok("TAVRO CARD PHONE 2.0"));
    char small[6];
    EXPECT_EQ(ParseIdentityReply(longLine.text(), longLine.length(), small, sizeof small), 5);
    EXPECT_STREQ(small, "TAVRO");
}

struct NumberRow {
    Source source;
    std::string reply;
    int expected;
};

TEST(DeviceReplies, SignalBarsKeepTheCardsMapping) {
    auto csq = [](const std::string& q) { return Ok("+CSQ: " + q + ",0"); };
    const NumberRow rows[] = {
        {kCard, csq("99"), 4},
        {kCard, csq("31"), 4},
        {kCard, csq("30"), 3},
        {kCard, csq("24"), 3},
        {kCard, csq("23"), 2},
        {kCard, csq("16"), 2},
        {kCard, csq("15"), 1},
        {kCard, csq("8"), 1},
        {kCard, csq("7"), 0},
        {kCard, csq("0"), 0},
        {kCard, Ok(), 0},
        {kStandard, Ok("+CSQ: 18,99"), 2},
        // The card's reading wants the blank after the tag; without it nothing is read.
        {kStandard, Ok("+CSQ:18,99"), 0},
        {kDamaged, csq("-4"), 0},
        {kDamaged, csq("99999999999"), 4},
        {kDamaged, Ok("+CSQ: "), 0},
        {kDamaged, "\r\nERROR\r\n", 0},
        {kDamaged, "", 0},
    };
    for (const NumberRow& row : rows) {
        const Bytes reply(row.reply);
        EXPECT_EQ(ParseSignalReply(reply.text(), reply.length()), row.expected)
            << SourceName(row.source) << " " << row.reply;
    }
}

TEST(DeviceReplies, SpeakerVolume) {
    const NumberRow rows[] = {
        {kCard, Ok("+CLVL: 7"), 7},
        {kCard, Ok("+CLVL: 0"), 0},
        {kCard, Ok("+CLVL: 10"), 10},
        {kStandard, Ok("+CLVL:3"), 3},
        {kStandard, "\r\n+CME ERROR: 4\r\n", -1},
        {kDamaged, Ok("+CLVL: x"), -1},
        {kDamaged, Ok(), -1},
        {kDamaged, "\r\n+CLVL:", -1},
        {kDamaged, "", -1},
    };
    for (const NumberRow& row : rows) {
        const Bytes reply(row.reply);
        EXPECT_EQ(ParseVolumeReply(reply.text(), reply.length()), row.expected)
            << SourceName(row.source) << " " << row.reply;
    }
}

struct TextRow {
    Source source;
    std::string reply;
    const char* expected;
};

TEST(DeviceReplies, OperatorInEveryFormat) {
    const TextRow rows[] = {
        {kCard, Ok("+COPS: 0,2,20205"), "PANAFON"},
        {kCard, Ok("+COPS: 1,2,23415"), "VODAFONE"},
        {kCard, Ok("+COPS: 0,2,99999"), ""},    // not in the table
        {kCard, ",2,20205\r\n\r\nOK\r\n", ""},  // the card's form is never read at offset 0
        {kStandard, Ok("+COPS: 0,2,\"23415\""), "VODAFONE"},
        {kStandard, Ok("+COPS: 0,2,\"20205\",7"), "PANAFON"},
        {kStandard, Ok("+COPS: 0,2,\"99999\""), ""},
        {kStandard, Ok("+COPS: 0,0,\"Vodafone UK\""), "Vodafone UK"},
        {kStandard, Ok("+COPS: 0,1,\"VODA\",2"), "VODA"},
        {kStandard, Ok("+COPS: 0,0,\"\""), ""},
        {kStandard, Ok("+COPS: 0,0,"), ""},  // no format chosen yet
        {kStandard, Ok("+COPS: 0"), ""},
        {kStandard, Ok("+COPS: 2"), ""},
        {kDamaged, Ok("+COPS: 0,2,\"2341x\""), ""},
        {kDamaged, Ok("+COPS: 0,2,\"234150000001\""), ""},
        {kDamaged, "\r\n+COPS: 0,0,\"Vodaf", ""},
        {kDamaged, Ok("+COPS: 0,5,\"Vodafone\""), ""},
        {kDamaged, "\r\nERROR\r\n", ""},
        {kDamaged, "", ""},
    };
    for (const TextRow& row : rows) {
        const Bytes reply(row.reply);
        char name[32] = "stale";
        const int n = ParseOperatorReply(reply.text(), reply.length(), name, sizeof name);
        EXPECT_EQ(std::string(name), row.expected) << SourceName(row.source) << " " << row.reply;
        EXPECT_EQ(n, static_cast<int>(std::strlen(row.expected)));
    }
    const Bytes longName(Ok("+COPS: 0,0,\"A very long network name\""));
    char small[7];
    EXPECT_EQ(ParseOperatorReply(longName.text(), longName.length(), small, sizeof small), 6);
    EXPECT_STREQ(small, "A very");
}

struct CallListRow {
    Source source;
    std::string reply;
    int result;
    int state;
    int mode;
    const char* number = "";  // the listed call's number, with '+' for a type of 145
};

TEST(DeviceReplies, CallListTellsNoCallFromNoise) {
    const std::string clean = "\r\nOK\r\n";
    const CallListRow rows[] = {
        {kCard, Ok("+CLCC: 1,1,0,0,0,\"+447700900123\",145"), kCallListCall, 0, 0, "+447700900123"},
        {kCard, Ok("+CLCC: 1,1,4,0,0,\"07700900123\",129"), kCallListCall, 4, 0, "07700900123"},
        {kCard, Ok("+CLCC: 1,0,2,0,0,\"112\",129"), kCallListCall, 2, 0, "112"},
        {kCard, clean, kCallListEmpty, -1, -1},
        {kCard, "\r\n+CRING: VOICE\r\n\r\n+CLIP: +4477,145\r\n" + clean, kCallListEmpty, -1, -1},
        {kStandard, Ok("+CLCC: 1,1,4,0,0,\"4915112345678\",145,\"\""), kCallListCall, 4, 0,
         "+4915112345678"},
        {kStandard, Ok("+CLCC: 1,1,4,0,0,\"\",128"), kCallListCall, 4, 0},  // withheld
        {kStandard, Ok("+CLCC: 1,0,3,1,0"), kCallListCall, 3, 1},
        {kStandard, Ok("+CLCC: 1,0,0,0,0\r\n+CLCC: 2,1,5,0,0"), kCallListCall, 0, 0},
        {kStandard, "AT+CLCC\r\r\nOK\r\n", kCallListEmpty, -1, -1},
        {kStandard, "\r\n^RSSI: 5\r\n\r\nOK\r\n\r\n*ECAV: 1,6,1\r\n", kCallListEmpty, -1, -1},
        {kStandard, "\r\nRING\r\n\r\nOK\r\n\r\n+CMTI: \"SM\",3\r\n", kCallListEmpty, -1, -1},
        {kStandard, "\r\nERROR\r\n", kCallListUnknown, -1, -1},
        {kStandard, "\r\n+CME ERROR: 100\r\n", kCallListUnknown, -1, -1},
        {kDamaged, "", kCallListUnknown, -1, -1},
        {kDamaged, "\r\n", kCallListUnknown, -1, -1},  // no final result yet
        {kDamaged, "\r\n\x8f\x13z\x01\r\n" + clean, kCallListUnknown, -1, -1},
        {kDamaged, clean + "\xfe\xff", kCallListUnknown, -1, -1},
        {kDamaged, "\r\nxyz\r\n" + clean, kCallListUnknown, -1, -1},
        {kDamaged, Ok("+CLCC: 1,1\xff,0,0,0"), kCallListUnknown, -1, -1},
        {kDamaged, "\r\n+CLCC: 1,1,4", kCallListUnknown, -1, -1},
        {kDamaged, Ok("+CLCC: 1,1,4,0x"), kCallListUnknown, -1, -1},
        {kDamaged, Ok("+CLCC: 1,1,4,0,0,\"+4477"), kCallListCall, 4, 0},  // an unclosed number
        {kDamaged, clean + clean, kCallListUnknown, -1, -1},
        {kDamaged, clean + "AT+CLCC\r", kCallListUnknown, -1, -1},
        {kDamaged, "\r\nO\r\n", kCallListUnknown, -1, -1},
    };
    for (const CallListRow& row : rows) {
        const Bytes reply(row.reply);
        int state = -1, mode = -1;
        std::string number = "left over";
        EXPECT_EQ(ParseCallListReply(reply.text(), reply.length(), &state, &mode, &number),
                  row.result)
            << SourceName(row.source) << " " << row.reply;
        EXPECT_EQ(state, row.state) << row.reply;
        EXPECT_EQ(mode, row.mode) << row.reply;
        if (row.result == kCallListCall) {
            EXPECT_EQ(number, row.number) << row.reply;
        }
    }
}

// Bursts of random bytes, as a noisy line delivers them, landing before, inside or after a clean
// empty call list: none of them may read as "no call".
TEST(DeviceReplies, LineNoiseIsNeverAnEmptyCallList) {
    const std::string clean = "\r\nOK\r\n";
    // A fixed start number: the same bursts on every run.
    std::minstd_rand bytes(1);
    for (int burst = 0; burst < 200; ++burst) {
        std::string noise;
        for (int i = 0; i < 1 + burst % 40; ++i)
            noise += static_cast<char>(bytes() & 0xFF);
        if (noise.find_first_not_of("\r\n") == std::string::npos) continue;  // no noise at all
        for (size_t at = 0; at <= clean.size(); ++at) {
            const Bytes reply(clean.substr(0, at) + noise + clean.substr(at));
            EXPECT_NE(ParseCallListReply(reply.text(), reply.length(), nullptr, nullptr),
                      kCallListEmpty)
                << "burst " << burst << " at " << at;
        }
    }
}

struct CallerIdRow {
    Source source;
    float firmware;
    std::string line;
    const char* number;
};

TEST(DeviceReplies, CallerIdByFirmwareAndQuoting) {
    const CallerIdRow rows[] = {
        {kCard, 3.80f, "+CLIP: +447700900123,145", "+447700900123"},
        {kCard, 3.80f, "+CLIP: 447700900123,145", "+447700900123"},
        {kCard, 3.81f, "+CLIP: 07700900123,129", "07700900123"},
        {kCard, 3.80f, "+CLIP:\r\n\t 123,129", "123"},
        {kCard, 3.80f, "+CLIP: 07700", "07700"},
        {kCard, 4.00f, "+CLIP: \"+447700900123\",145", "+447700900123"},
        {kCard, 4.00f, "+CLIP: \"07700900123\",129", "07700900123"},
        {kCard, 4.00f, "+CLIP: 07700900123,129", ""},  // later firmware is read quoted only
        {kStandard, 0.0f, "+CLIP: \"4915112345678\",145,,,,0", "+4915112345678"},
        {kStandard, 0.0f, "+CLIP: \"4915112345678\",129,,,,0", "4915112345678"},
        {kStandard, 3.80f, "+CLIP: \"4915112345678\",145", "+4915112345678"},
        {kStandard, 0.0f, "+CLIP: \"\",128,,,,1", ""},  // withheld
        {kStandard, 0.0f, "+CLIP: \"+4915112345678\",145,,,\"Anna\",0", "+4915112345678"},
        {kDamaged, 3.80f, "+CLIP: \"4477", ""},
        {kDamaged, 4.00f, "+CLIP: 12,\"99\"", "99"},  // the card's rule takes the next quoted field
        {kDamaged, 3.80f, "+CLIP:", ""},
        {kDamaged, 3.80f, "+CLIP: ,145", ""},
        {kDamaged, 3.80f, "+CRING: VOICE", ""},
        {kDamaged, 0.0f, "", ""},
    };
    for (const CallerIdRow& row : rows) {
        const Bytes line(row.line);
        char number[32] = "stale";
        const int n =
            ParseCallerIdLine(line.text(), line.length(), row.firmware, number, sizeof number);
        EXPECT_EQ(std::string(number), row.number)
            << SourceName(row.source) << " " << row.firmware << " " << row.line;
        EXPECT_EQ(n, static_cast<int>(std::strlen(row.number)));
    }
    // A small buffer keeps the '+' and as many digits as fit.
    const Bytes line("+CLIP: \"4915112345678\",145");
    char small[5];
    EXPECT_EQ(ParseCallerIdLine(line.text(), line.length(), 0.0f, small, sizeof small), 4);
    EXPECT_STREQ(small, "+491");
}

// The wrappers send their commands and hand the replies to the parsers above.
class DeviceWrappersTest : public ::testing::Test {
  protected:
    void Open(std::map<std::string, std::string> replies) {
        replies_ = std::move(replies);
        card_ = std::make_unique<testing::FakeCard>([this](const std::string& command) {
            std::lock_guard<std::mutex> lock(repliesMutex_);
            const auto found = replies_.find(command);
            return found != replies_.end() ? found->second : Ok();
        });
        link_ = std::make_unique<Link>(settings_, DriverRoots{folder_ + "/run", folder_ + "/tty"});
        testing::ShortenLinkWaits(*link_);
        ASSERT_EQ(PortOpenDevice(*link_, card_->Device().c_str()), 1);
    }
    void TearDown() override {
        if (link_) PortClose(*link_);
    }
    // The polls give up (-1) while the listener holds the port; ask again then, a bounded
    // number of times.
    int Poll(int (*query)(Link&)) {
        int result = -1;
        for (int attempt = 0; attempt < 200 && result == -1; ++attempt) {
            result = query(*link_);
            if (result == -1) std::this_thread::sleep_for(std::chrono::milliseconds(20));
        }
        return result;
    }

    const testing::TempFolder temp_;
    const std::string folder_ = temp_.Path();
    SettingsStore settings_{folder_ + "/settings.db"};
    std::mutex repliesMutex_;  // the card answers on its own thread
    std::map<std::string, std::string> replies_;
    std::unique_ptr<testing::FakeCard> card_;
    std::unique_ptr<Link> link_;
};

TEST_F(DeviceWrappersTest, CardDialect) {
    Open({{"AT+GMR", Ok("SW3.80")},
          {"AT+GMI", Ok("Tavro Mobile Phones")},
          {"AT+GMM", Ok("TAVRO CARD PHONE 2.0")},
          {"AT+CSQ", Ok("+CSQ: 20,0")},
          {"AT+COPS?", Ok("+COPS: 0,2,20205")},
          {"AT+CLVL?", Ok("+CLVL: 7")},
          {"AT+CLVL=11", "\r\nERROR\r\n"},
          {"AT+CLCC", Ok("+CLCC: 1,1,4,0,0,\"+447700900123\",145")}});
    char16_t maker[64], model[64], firmware[64];
    EXPECT_EQ(GetCardIdentity(*link_, maker, 64, model, 64, firmware, 64), 1);
    EXPECT_EQ(std::u16string(maker), u"Tavro Mobile Phones");
    EXPECT_EQ(std::u16string(model), u"TAVRO CARD PHONE 2.0");
    EXPECT_EQ(std::u16string(firmware), u"SW3.80");
    EXPECT_FLOAT_EQ(GetFirmwareVersion(*link_, nullptr, 0), 3.80f);
    EXPECT_EQ(Poll(GetSignalBars), 2);
    // A poll gives way to whoever holds the port; the in-turn query waits for it.
    ASSERT_EQ(PortLock(*link_), 1);
    EXPECT_EQ(GetSignalBars(*link_), -1);
    std::atomic<int> inTurn{-2};
    std::thread asker([&] { inTurn = GetSignalBarsInTurn(*link_); });
    ASSERT_TRUE(testing::WaitFor([&] {
        std::lock_guard<std::mutex> lock(link_->portMutex);
        return link_->nextTicket > link_->servingTicket;
    }));
    PortUnlock(*link_);
    asker.join();
    EXPECT_EQ(inTurn.load(), 2);
    char16_t name[32];
    EXPECT_EQ(GetOperatorName(*link_, name, 32), 1);
    EXPECT_EQ(std::u16string(name), u"PANAFON");
    EXPECT_EQ(Poll(GetSpeakerVolume), 7);
    EXPECT_EQ(SetSpeakerVolume(*link_, 3), 0);
    EXPECT_EQ(SetSpeakerVolume(*link_, 11), 4);
    int state = -1, mode = -1;
    EXPECT_EQ(QueryCallState(*link_, &state, &mode), kCallListCall);
    EXPECT_EQ(state, 4);
    EXPECT_EQ(mode, 0);
}

TEST_F(DeviceWrappersTest, StandardModem) {
    Open({{"AT+GMR", Ok("REV1")},
          {"AT+CSQ", Ok("+CSQ: 99,99")},
          {"AT+COPS?", Ok("+COPS: 0,0,\"Vodafone UK\"")},
          {"AT+CLVL?", "\r\n+CME ERROR: 4\r\n"},
          {"AT+CLCC", "\r\n+CME ERROR: 100\r\n"}});
    char16_t text[64];
    EXPECT_FLOAT_EQ(GetFirmwareVersion(*link_, text, 64), 0.0f);
    EXPECT_EQ(std::u16string(text), u"REV1");
    EXPECT_EQ(Poll(GetSignalBars), 4);
    char16_t name[32];
    EXPECT_EQ(GetOperatorName(*link_, name, 32), 1);
    EXPECT_EQ(std::u16string(name), u"Vodafone UK");
    EXPECT_EQ(GetSpeakerVolume(*link_), -1);
    EXPECT_EQ(QueryCallState(*link_, nullptr, nullptr), kCallListUnknown);
    {
        std::lock_guard<std::mutex> lock(repliesMutex_);
        replies_["AT+CLCC"] = Ok();
    }
    EXPECT_EQ(QueryCallState(*link_, nullptr, nullptr), kCallListEmpty);
}

}  // namespace
}  // namespace vqm
