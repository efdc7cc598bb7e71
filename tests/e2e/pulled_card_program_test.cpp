// The card pulled out of the running dialer in the middle of each kind of exchange: the real
// vqm-dialer on the simulated card, the exchange started through the dialer's socket (or
// vqm-phone through the dialer), the card held at a known command with `ctl hold` so that the
// pull comes while the dialer waits on it. Each time the dialer must go on answering, say
// "No Card Phone inserted." soon (the time from the pull to that line is printed as
// "pulled-card <kind> <ms>" for bench figures; only a hang fails it), leave every file it keeps
// in whole records, and take the card again once it is put back, without a restart. Each on the
// card's own personality and on a standard 27.007 modem.
#include <gtest/gtest.h>

#include <chrono>
#include <cmath>
#include <cstdio>
#include <cstring>
#include <filesystem>
#include <functional>
#include <ostream>
#include <string>
#include <tuple>
#include <vector>

#include "calls/call_log.h"
#include "calls/event_log.h"
#include "contacts/phonebook_cache.h"
#include "contacts/phonebook_entry.h"
#include "messaging/message_store.h"
#include "tests/common/program_host.h"

namespace vqm {
namespace {

namespace fs = std::filesystem;
using namespace std::chrono_literals;
using testing::Background;
using testing::WaitFor;

constexpr char kNoCard[] = "status No Card Phone inserted.";
constexpr char kConnected[] = "card 2 connected";
constexpr int kDialPad = 40001, kSmsFolder = 40003, kManageContacts = 40004, kSettings = 40005;
constexpr int kCallKey = 1138;
constexpr int kNetworkPage = 1112, kManual = 1062, kSearch = 1064;
constexpr int kForwardPage = 1113, kForwardRequest = 1076;

// Every file of the install folder that holds fixed-size records, with that size.
struct RecordFile {
    const char* name;
    size_t size;
};
const RecordFile kRecordFiles[] = {
    {"callog1.db", kCallLogRecordSize},
    {"callog2.db", kCallLogRecordSize},
    {"callog3.db", kCallLogRecordSize},
    {"event.log", kEventRecordSize},
    {"smsmsg1.db", kSmsRecordSize},
    {"smsmsg2.db", kSmsRecordSize},
    {"sm_clipbd.txt", kClipboardEntrySize},
    {"simphonebk1.db", sizeof(PhonebookEntry)},
    {"simphonebk2.db", sizeof(PhonebookEntry)},
    {"phonebk1.db", kOutlookMobileRecordSize},
    {"phonebk2.db", kOutlookNumbersRecordSize},
    {"phonebk3.db", kOutlookNumbersRecordSize},
};

class PulledCardTest;

// One kind of exchange: the card's options, the command it is held at (none for the call
// states, which the card reports itself), how the exchange is started, and what the card's
// status shows once it is under way.
struct Exchange {
    const char* kind;
    const char* cardOptions;
    const char* holdAt;
    std::function<void(PulledCardTest&)> start;
    const char* underWay;
};

void PrintTo(const Exchange& exchange, std::ostream* out) {
    *out << exchange.kind;
}

// Public host: the table's start functions drive the programs through it.
class PulledCardTest : public ::testing::TestWithParam<std::tuple<Exchange, const char*>>,
                       public testing::ProgramHost {
  public:
    // The Settings pages write the modem's files: into the test's folder.
    PulledCardTest() : ProgramHost(/*ownConfig=*/true) {}
    ~PulledCardTest() override { ExitDialer(); }

    void StartDialer() { ProgramHost::StartDialer("--answer-boxes ok"); }
    // Connected, and the DialPad's first look at the network over.
    void WaitSettled() {
        ASSERT_TRUE(LogShows(kConnected, 30s)) << Log();
        ASSERT_TRUE(LogShows("settings-network operator")) << Log();
    }
    // vqm-phone's command, sent to the running dialer, left to run.
    void PhoneThroughDialer(const std::string& arguments) {
        phone_.Start(Environment() + VQM_PHONE + " " + arguments + " >" + (temp_ / "phone.out") +
                     " 2>&1");
    }
    // Taps id until the card holds (a page greys the window while it waits for the card, and a
    // tap then is not taken).
    bool TapUntilHeld(int id) {
        for (int attempt = 0; attempt < 10; ++attempt) {
            Command(id);
            if (CardShows("held=1", 2s)) return true;
        }
        return false;
    }

    // Records that are not whole: a file whose size is not a whole number of records, or a
    // call-log record whose number or time is not a terminated string.
    std::string Torn() const {
        std::string torn;
        for (const RecordFile& file : kRecordFiles) {
            std::error_code error;
            const auto bytes = fs::file_size(install_ + file.name, error);
            if (!error && bytes % file.size != 0)
                torn += std::string(file.name) + " " + std::to_string(bytes) + " bytes; ";
        }
        for (const char* name : {"callog1.db", "callog2.db", "callog3.db"}) {
            const std::string data = Read(install_ + name);
            for (size_t at = 0; at + kCallLogRecordSize <= data.size(); at += kCallLogRecordSize) {
                CallLogRecord record;
                std::memcpy(&record, data.data() + at, sizeof record);
                if (strnlen(record.number, sizeof record.number) == sizeof record.number ||
                    strnlen(record.time, sizeof record.time) != 19)
                    torn += std::string(name) + " record " +
                            std::to_string(at / kCallLogRecordSize) + "; ";
            }
        }
        return torn;
    }

    const std::string install_ = temp_ / "data/VQMFull/";
    Background phone_;
};

TEST_P(PulledCardTest, TheDialerSaysTheCardIsGoneKeepsItsFilesWholeAndTakesItBack) {
    const Exchange& exchange = std::get<0>(GetParam());
    const std::string dialect = std::get<1>(GetParam());
    ASSERT_NO_FATAL_FAILURE(
        StartCard("--dialect " + dialect + " --power-up-ms 500 " + exchange.cardOptions));
    if (exchange.holdAt[0]) {
        ASSERT_EQ(Ctl(std::string("hold ") + exchange.holdAt).second, 0);
    }
    ASSERT_NO_FATAL_FAILURE(exchange.start(*this));
    ASSERT_TRUE(CardShows(exchange.underWay)) << Ctl("status").first << Log();
    ASSERT_TRUE(dialer_.Running()) << dialer_.EndedBy();

    const size_t noCardBefore = Count(kNoCard), connectedBefore = Count(kConnected);
    const double pulledAt =
        std::chrono::duration<double>(std::chrono::system_clock::now().time_since_epoch()).count();
    ASSERT_EQ(Ctl("pull").second, 0);
    // A hang shows here; the figure is the time in the log.
    ASSERT_TRUE(LogShows(kNoCard, 20s, noCardBefore + 1)) << Log();
    const double shownAt = LogTime(kNoCard, noCardBefore + 1).value_or(0);
    const long ms = std::lround((shownAt - pulledAt) * 1000);
    std::printf("pulled-card %s %s %ld\n", dialect.c_str(), exchange.kind, ms);
    std::fflush(stdout);
    EXPECT_LT(ms, 5000) << Log();

    // Still there, and its window still takes clicks.
    EXPECT_TRUE(dialer_.Running()) << dialer_.EndedBy() << Read(temp_ / "dialer.out");
    EXPECT_EQ(Command(kDialPad, 5000), 0L);
    EXPECT_TRUE(WaitFor([&] { return Torn().empty(); }, 5s)) << Torn();
    // vqm-phone's request ends with the card.
    if (phone_.Pid() > 0) {
        EXPECT_NE(phone_.WaitExit(20s), -1) << Read(temp_ / "phone.out");
    }

    // Put back: the dialer powers it up and connects again by itself.
    ASSERT_EQ(Ctl("insert").second, 0);
    EXPECT_TRUE(LogShows(kConnected, 30s, connectedBefore + 1)) << Log();
    EXPECT_TRUE(dialer_.Running()) << dialer_.EndedBy();
    ExitDialer();
    EXPECT_EQ(Torn(), "");
}

const Exchange kExchanges[] = {
    // The dialer asks the card manager to power the card up, then types the card's start-up
    // commands: the card hangs at the data-call bearer, half way through them.
    {"power-up", "", "+CBST=", [](PulledCardTest& t) { t.StartDialer(); }, "held=1"},
    // The far end takes a minute to decide on the call.
    {"dial", "--powered --dial-delay-ms 60000", "",
     [](PulledCardTest& t) {
         t.StartDialer();
         t.WaitSettled();
         t.Type("0123456");
         t.Command(kCallKey);
     },
     "call=dialing"},
    {"call", "--powered", "",
     [](PulledCardTest& t) {
         t.StartDialer();
         t.WaitSettled();
         ASSERT_EQ(t.Ctl("ring +447700900123").second, 0);
         ASSERT_TRUE(t.LogShows("status Incoming call")) << t.Log();
         t.Command(kCallKey);
     },
     "call=active"},
    // vqm-phone's send through the dialer: the card hangs before its text prompt.
    {"sms-send", "--powered", "+CMGS=",
     [](PulledCardTest& t) {
         t.StartDialer();
         t.WaitSettled();
         t.PhoneThroughDialer("sms send +447700900123 --text Pulled");
     },
     "held=1"},
    // The SMS Folder reads the SIM's three messages: the card hangs at the second.
    {"sim-refresh", "--powered", "+CMGR=2",
     [](PulledCardTest& t) {
         t.StartDialer();
         t.WaitSettled();
         t.Command(kSmsFolder);
     },
     "held=1"},
    // Manage Contacts builds the SIM phonebook's cache ten places at a time: the card hangs at
    // the second ten, the first already in the file.
    {"phonebook-cache", "--powered", "+CPBR=11,",
     [](PulledCardTest& t) {
         ASSERT_EQ(t.Ctl("phonebook-fill SM 30").second, 0);
         t.StartDialer();
         t.WaitSettled();
         t.Command(kManageContacts, 500);
     },
     "held=1"},
    {"network-search", "--powered", "+COPS=?",
     [](PulledCardTest& t) {
         t.StartDialer();
         t.WaitSettled();
         t.Command(kSettings);
         t.Command(kNetworkPage);
         t.Command(kManual);
         t.Command(kSearch);
     },
     "held=1"},
    {"forwarding-query", "--powered", "+CCFC=",
     [](PulledCardTest& t) {
         t.StartDialer();
         t.WaitSettled();
         t.Command(kSettings);
         t.Command(kForwardPage);
         ASSERT_TRUE(t.TapUntilHeld(kForwardRequest)) << t.Log();
     },
     "held=1"},
};

INSTANTIATE_TEST_SUITE_P(Exchanges, PulledCardTest,
                         ::testing::Combine(::testing::ValuesIn(kExchanges),
                                            ::testing::Values("card", "standard")),
                         [](const auto& info) {
                             std::string name;
                             for (const char* c = std::get<0>(info.param).kind; *c; ++c)
                                 if (*c != '-') name += *c;
                             return name + "_" + std::get<1>(info.param);
                         });

}  // namespace
}  // namespace vqm
