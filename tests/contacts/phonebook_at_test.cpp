// The phonebook commands on a real pseudo-terminal: byte-exact command texts against a scripted
// card, and the whole round trip against the simulated card's phonebooks.
#include "contacts/phonebook_at.h"

#include <gtest/gtest.h>

#include <chrono>
#include <cstring>
#include <fstream>
#include <map>
#include <memory>
#include <mutex>
#include <sstream>
#include <string>
#include <thread>
#include <vector>

#include "cardsim/card_sim.h"
#include "link/link.h"
#include "support/settings_store.h"
#include "tests/common/fake_card.h"
#include "tests/common/link_waits.h"
#include "tests/common/temp_folder.h"

namespace vqm {
namespace {

// The final result of a whole reply, read within its own length.
int FinalOf(const std::string& reply) {
    return AtFinalResult(reply.c_str(), static_cast<int>(reply.size()));
}

using testing::FakeCard;
using testing::TempFolder;

std::string Number(const PhonebookEntry& e) {
    return std::string(e.number, e.numberLength);
}
std::string Text(const PhonebookEntry& e) {
    return std::string(e.text, e.textLength);
}

PhonebookEntry MakeEntry(int index, const std::string& number, int type, const std::string& text) {
    PhonebookEntry e = {};
    e.index = index;
    e.type = type;
    e.numberLength = static_cast<int32_t>(number.size());
    e.textLength = static_cast<int32_t>(text.size());
    std::memcpy(e.number, number.data(), number.size());
    std::memcpy(e.text, text.data(), text.size());
    return e;
}

std::unique_ptr<Link> MakeLink(SettingsStore& settings, const TempFolder& temp) {
    auto link = std::make_unique<Link>(settings, DriverRoots{temp / "run", temp / "tty"});
    // The first-byte wait shortened; the 200 ms silence that ends a reply stays as it is.
    testing::ShortenLinkWaits(*link);
    return link;
}

// A card that records the phonebook commands it is sent and answers each from a table
// (a command missing from the table gets OK).
class ScriptedCardTest : public ::testing::Test {
  protected:
    ScriptedCardTest()
        : card_([this](const std::string& command) {
              std::lock_guard<std::mutex> lock(mutex_);
              if (command.find("+CPB") != std::string::npos) sent_.push_back(command);
              auto it = answers_.find(command);
              return it != answers_.end() ? it->second : std::string("\r\nOK\r\n");
          }) {
        link_ = MakeLink(settings_, temp_);
        EXPECT_EQ(PortOpenDevice(*link_, card_.Device().c_str()), 1);
    }
    ~ScriptedCardTest() override { PortClose(*link_); }

    void Answer(const std::string& command, const std::string& reply) {
        std::lock_guard<std::mutex> lock(mutex_);
        answers_[command] = reply;
    }
    std::vector<std::string> Sent() {
        std::lock_guard<std::mutex> lock(mutex_);
        std::vector<std::string> sent;
        sent.swap(sent_);
        return sent;
    }

    const TempFolder temp_;
    SettingsStore settings_{temp_ / "settings.db"};
    std::mutex mutex_;
    std::map<std::string, std::string> answers_;
    std::vector<std::string> sent_;
    FakeCard card_;
    std::unique_ptr<Link> link_;
};

using Commands = std::vector<std::string>;

TEST_F(ScriptedCardTest, SelectSendsTheStorageAndReturnsTheResultCode) {
    EXPECT_EQ(PhonebookSelect(*link_, 7), 0);
    Answer("AT+CPBS=\"ME\"", "\r\nERROR\r\n");
    EXPECT_EQ(PhonebookSelect(*link_, 4), 4);
    EXPECT_EQ(Sent(), (Commands{"AT+CPBS=\"SM\"", "AT+CPBS=\"ME\""}));
    EXPECT_EQ(PhonebookSelect(*link_, 8), -1);
    EXPECT_EQ(PhonebookSelect(*link_, -1), -1);
    EXPECT_TRUE(Sent().empty());
}

TEST_F(ScriptedCardTest, UsageAndGeometryCommands) {
    Answer("AT+CPBS?", "\r\n+CPBS: \"SM\",3,250\r\n\r\nOK\r\n");
    Answer("AT+CPBR=?", "\r\n+CPBR: (0-99),20,10\r\n\r\nOK\r\n");
    int32_t used = 0, total = 0;
    EXPECT_EQ(PhonebookGetUsage(*link_, &used, &total), 1);
    EXPECT_EQ(used, 3);
    EXPECT_EQ(total, 250);
    int32_t n = -1, t = -1, h = -1;
    EXPECT_EQ(PhonebookGetGeometry(*link_, &n, &t, &h), 0);
    EXPECT_EQ(h, 0);  // the range does not start at 1
    EXPECT_EQ(n, 20);
    EXPECT_EQ(t, 10);
    Answer("AT+CPBR=?", "\r\nERROR\r\n");
    n = t = h = -1;
    EXPECT_EQ(PhonebookGetGeometry(*link_, &n, &t, &h), 4);
    EXPECT_EQ(n + t + h, 0);  // zeroed before asking
    EXPECT_EQ(Sent(), (Commands{"AT+CPBS?", "AT+CPBR=?", "AT+CPBR=?"}));
}

TEST_F(ScriptedCardTest, RangeReadChecksItsBoundsAndPacksWhatIsListed) {
    PhonebookEntry slots[10] = {};
    EXPECT_EQ(PhonebookReadRange(*link_, 5, 4, slots), 0);
    EXPECT_EQ(PhonebookReadRange(*link_, 0, 4, slots), 0);
    EXPECT_EQ(PhonebookReadEntry(*link_, 0, slots), 0);
    EXPECT_TRUE(Sent().empty());

    Answer("AT+CPBR=1,10",
           "\r\n+CPBR: 1,\"111\",129,\"A\"\r\n\r\n+CPBR: 4,\"444\",129,\"B\"\r\n"
           "\r\n+CPBR: 10,\"+10\",145,\"C\"\r\n\r\nOK\r\n");
    EXPECT_EQ(PhonebookReadRange(*link_, 1, 10, slots), 1);
    EXPECT_EQ(slots[0].index, 1);
    EXPECT_EQ(slots[1].index, 4);
    EXPECT_EQ(slots[2].index, 10);
    EXPECT_EQ(slots[2].type, 145);
    for (int i = 3; i < 10; ++i)
        EXPECT_EQ(slots[i].numberLength, 0) << i;
    // A reply with no entries at all still counts as read.
    Answer("AT+CPBR=11,20", "\r\nOK\r\n");
    EXPECT_EQ(PhonebookReadRange(*link_, 11, 20, slots), 1);

    Answer("AT+CPBR=7", "\r\n+CPBR: 7,\"0777\",129,\"Seven\"\r\n\r\nOK\r\n");
    PhonebookEntry one = {};
    EXPECT_EQ(PhonebookReadEntry(*link_, 7, &one), 1);
    EXPECT_EQ(Text(one), "Seven");
    EXPECT_EQ(Sent(), (Commands{"AT+CPBR=1,10", "AT+CPBR=11,20", "AT+CPBR=7"}));
}

TEST_F(ScriptedCardTest, WriteSelectsWhateverTheSelectAnswers) {
    Answer("AT+CPBS=\"ME\"", "\r\nERROR\r\n");
    EXPECT_EQ(PhonebookWriteEntry(*link_, "ME", MakeEntry(12, "0123", 129, "Bob \xE9")), 0);
    EXPECT_EQ(Sent(), (Commands{"AT+CPBS=\"ME\"", "AT+CPBW=12,\"0123\",129,\"Bob \xE9\""}));

    // An unknown storage code selects nothing; the write still goes out.
    Answer("AT+CPBW=3,\"+44\",145,\"x\"", "\r\nERROR\r\n");
    EXPECT_EQ(PhonebookWriteEntry(*link_, "XX", MakeEntry(3, "+44", 145, "x")), 4);
    EXPECT_EQ(Sent(), (Commands{"AT+CPBW=3,\"+44\",145,\"x\""}));

    // Fields that fill their whole array without a terminator stop at the array's end.
    PhonebookEntry full = MakeEntry(1, "", 129, "");
    std::memset(full.number, '5', sizeof full.number);
    std::memset(full.text, 'T', sizeof full.text);
    EXPECT_EQ(PhonebookWriteEntry(*link_, "SM", full), 0);
    EXPECT_EQ(Sent(), (Commands{"AT+CPBS=\"SM\"", "AT+CPBW=1,\"" + std::string(32, '5') +
                                                      "\",129,\"" + std::string(32, 'T') + "\""}));
}

TEST_F(ScriptedCardTest, DeleteJudgesByALiteralOk) {
    EXPECT_EQ(PhonebookDeleteEntry(*link_, "SM", 5), 1);
    EXPECT_EQ(Sent(), (Commands{"AT+CPBS=\"SM\"", "AT+CPBW=5"}));
    Answer("AT+CPBW=6", "\r\nERROR\r\n");
    EXPECT_EQ(PhonebookDeleteEntry(*link_, "ZZ", 6), 0);
    EXPECT_EQ(Sent(), (Commands{"AT+CPBW=6"}));
    // No final result the link knows, but "OK" inside the text: still a success.
    Answer("AT+CPBW=7", "\r\n+CME ERROR: BOOK\r\n");
    EXPECT_EQ(PhonebookDeleteEntry(*link_, "SM", 7), 1);
}

TEST(PhonebookNoCard, EveryOperationReportsNoReply) {
    const TempFolder temp;
    SettingsStore settings(temp / "settings.db");
    auto link = MakeLink(settings, temp);  // never opened
    int32_t a = 5, b = 5, c = 5;
    PhonebookEntry e = {};
    EXPECT_EQ(PhonebookSelect(*link, 7), -1);
    EXPECT_EQ(PhonebookGetUsage(*link, &a, &b), 0);
    EXPECT_EQ(PhonebookGetGeometry(*link, &a, &b, &c), -1);
    EXPECT_EQ(a + b + c, 0);
    EXPECT_EQ(PhonebookReadEntry(*link, 1, &e), 0);
    EXPECT_EQ(PhonebookReadRange(*link, 1, 10, &e), 0);
    EXPECT_EQ(PhonebookWriteEntry(*link, "SM", MakeEntry(1, "1", 129, "a")), -1);
    EXPECT_EQ(PhonebookDeleteEntry(*link, "SM", 1), 0);
}

TEST(PhonebookGeometrySettings, SavedPerStorageAndLoadedBack) {
    const TempFolder temp;
    SettingsStore settings(temp / "settings.db");
    int32_t n = -1, t = -1, total = -1;
    EXPECT_EQ(PhonebookLoadGeometry(settings, "sm", &n, &t, &total), 0);
    EXPECT_EQ(n, -1);
    EXPECT_EQ(PhonebookSaveGeometry(settings, "sm", 20, 18, 250), 1);
    EXPECT_EQ(PhonebookSaveGeometry(settings, "me", 30, 30, 100), 1);
    int32_t stored = 0;
    EXPECT_EQ(GetSettingInt(settings, u"sm_nlength", &stored), 1);
    EXPECT_EQ(stored, 20);
    EXPECT_EQ(GetSettingInt(settings, u"me_total", &stored), 1);
    EXPECT_EQ(stored, 100);
    EXPECT_EQ(PhonebookLoadGeometry(settings, "sm", &n, &t, &total), 1);
    EXPECT_EQ(n, 20);
    EXPECT_EQ(t, 18);
    EXPECT_EQ(total, 250);
}

// The simulated card's phonebooks through the wrappers.
class SimulatedPhonebookTest : public ::testing::Test {
  protected:
    void Start(const std::string& stateFile = {}) {
        cardsim::SimConfig config;
        config.baud = 0;
        config.runtimeDir = temp_ / "run";
        config.stateFile = stateFile;
        sim_ = std::make_unique<cardsim::CardSim>(config);
        ASSERT_TRUE(sim_->PowerUp());
        link_ = MakeLink(settings_, temp_);
        ASSERT_EQ(PortOpenDevice(*link_, sim_->DevicePath().c_str()), 1);
    }
    void Stop() {
        if (link_) PortClose(*link_);
        link_.reset();
        sim_.reset();
    }
    ~SimulatedPhonebookTest() override { Stop(); }

    std::string Command(const std::string& command) {
        char reply[1024];
        unsigned n = AtCommand(*link_, command.c_str(), reply, sizeof reply);
        return std::string(reply, n);
    }
    PhonebookEntry Read(int index) {
        PhonebookEntry e = {};
        PhonebookReadEntry(*link_, index, &e);
        return e;
    }
    // The whole storage as the cache builder reads it: runs of ten up to the total.
    std::vector<PhonebookEntry> ReadAll(int total) {
        std::vector<PhonebookEntry> all;
        for (int first = 1; first <= total; first += 10) {
            const int last = std::min(first + 9, total);
            PhonebookEntry slots[10] = {};
            EXPECT_EQ(PhonebookReadRange(*link_, first, last, slots), 1);
            for (const PhonebookEntry& e : slots)
                if (e.numberLength > 0) all.push_back(e);
        }
        return all;
    }

    const TempFolder temp_;
    SettingsStore settings_{temp_ / "settings.db"};
    std::unique_ptr<cardsim::CardSim> sim_;
    std::unique_ptr<Link> link_;
};

TEST_F(SimulatedPhonebookTest, DemoCardReportsItsBooksAndGeometry) {
    Start(temp_ / "new.state");  // a card with no kept state yet starts with the demo books
    ASSERT_EQ(PhonebookSelect(*link_, kStorageSimCard), 0);
    int32_t used = 0, total = 0, n = 0, t = 0, h = 0;
    EXPECT_EQ(PhonebookGetUsage(*link_, &used, &total), 1);
    EXPECT_EQ(PhonebookGetGeometry(*link_, &n, &t, &h), 0);
    EXPECT_EQ(total, h);
    EXPECT_EQ(h, 250);
    EXPECT_GE(used, 6);
    EXPECT_GT(n, 0);
    EXPECT_LE(n, kPhonebookNumberSize - 2);  // a '+' and the digits fit with the terminator
    EXPECT_LE(t, kPhonebookTextSize - 1);

    const std::vector<PhonebookEntry> sim = ReadAll(h);
    EXPECT_EQ(static_cast<int>(sim.size()), used);
    bool alice = false, latin = false;
    for (const PhonebookEntry& e : sim) {
        alice |= Number(e) == "+447700900123" && Text(e) == "Alice Smith" && e.type == 145;
        for (char c : Text(e))
            latin |= static_cast<unsigned char>(c) >= 0xC0;
        EXPECT_EQ(e.type, Number(e)[0] == '+' ? 145 : 129) << Number(e);
    }
    EXPECT_TRUE(alice);
    EXPECT_TRUE(latin);

    ASSERT_EQ(PhonebookSelect(*link_, kStorageCardPhone), 0);
    EXPECT_EQ(PhonebookGetUsage(*link_, &used, &total), 1);
    EXPECT_EQ(PhonebookGetGeometry(*link_, &n, &t, &h), 0);
    EXPECT_EQ(h, 100);
    EXPECT_EQ(static_cast<int>(ReadAll(h).size()), used);
    EXPECT_GE(used, 1);
    // Storages the card does not have are refused.
    EXPECT_EQ(PhonebookSelect(*link_, 0), 4);
}

TEST_F(SimulatedPhonebookTest, FullSimReadInRunsOfTenAndGapsPacked) {
    Start();
    ASSERT_EQ(sim_->Control("phonebook-fill SM 250"), "OK");
    ASSERT_EQ(PhonebookSelect(*link_, kStorageSimCard), 0);
    const std::vector<PhonebookEntry> all = ReadAll(250);
    ASSERT_EQ(all.size(), 250u);
    for (int i = 0; i < 250; ++i) {
        EXPECT_EQ(all[i].index, i + 1);
        EXPECT_GT(all[i].numberLength, 0);
        EXPECT_GT(all[i].textLength, 0);
    }
    EXPECT_NE(Number(all[0]), Number(all[249]));

    // Places 2, 3 and 7 emptied: the run of ten lists seven, packed at the front.
    for (int index : {2, 3, 7})
        EXPECT_EQ(PhonebookDeleteEntry(*link_, "SM", index), 1);
    PhonebookEntry slots[10] = {};
    EXPECT_EQ(PhonebookReadRange(*link_, 1, 10, slots), 1);
    const int expected[] = {1, 4, 5, 6, 8, 9, 10};
    for (int i = 0; i < 7; ++i)
        EXPECT_EQ(slots[i].index, expected[i]);
    for (int i = 7; i < 10; ++i)
        EXPECT_EQ(slots[i].numberLength, 0);
}

TEST_F(SimulatedPhonebookTest, WriteDeleteAndFirstFreePlace) {
    Start();
    ASSERT_EQ(sim_->Control("phonebook-clear ME"), "OK");
    // The wrapper selects the storage itself.
    ASSERT_EQ(PhonebookWriteEntry(*link_, "ME", MakeEntry(12, "+447700900999", 145, "Zo\xEB \xFF")),
              0);
    PhonebookEntry e = Read(12);
    EXPECT_EQ(e.index, 12);
    EXPECT_EQ(Number(e), "+447700900999");
    EXPECT_EQ(e.type, 145);
    EXPECT_EQ(Text(e), "Zo\xEB \xFF");
    int32_t used = 0, total = 0;
    EXPECT_EQ(PhonebookGetUsage(*link_, &used, &total), 1);
    EXPECT_EQ(used, 1);
    EXPECT_EQ(total, 100);

    // Overwriting a place replaces it.
    ASSERT_EQ(PhonebookWriteEntry(*link_, "ME", MakeEntry(12, "0123", 129, "Other")), 0);
    EXPECT_EQ(Text(Read(12)), "Other");

    // Without an index the card takes the lowest free place.
    EXPECT_EQ(FinalOf(Command("AT+CPBW=,\"0456\",129,\"First\"\r")), 0);
    EXPECT_EQ(Text(Read(1)), "First");
    EXPECT_EQ(FinalOf(Command("AT+CPBW=,\"0789\"\r")), 0);
    EXPECT_EQ(Number(Read(2)), "0789");

    EXPECT_EQ(PhonebookDeleteEntry(*link_, "ME", 12), 1);
    EXPECT_EQ(Read(12).numberLength, 0);
    EXPECT_EQ(PhonebookReadEntry(*link_, 12, &e), 0);
    EXPECT_EQ(PhonebookGetUsage(*link_, &used, &total), 1);
    EXPECT_EQ(used, 2);
}

TEST_F(SimulatedPhonebookTest, CardRefusesWhatDoesNotFit) {
    Start();
    int32_t n = 0, t = 0, h = 0;
    ASSERT_EQ(PhonebookSelect(*link_, kStorageSimCard), 0);
    ASSERT_EQ(PhonebookGetGeometry(*link_, &n, &t, &h), 0);
    const std::string longest(n, '7'), longestName(t, 'n');
    EXPECT_EQ(PhonebookWriteEntry(*link_, "SM", MakeEntry(h, "+" + longest, 145, longestName)), 0);
    EXPECT_EQ(PhonebookWriteEntry(*link_, "SM", MakeEntry(h, longest + "7", 129, "x")), 4);
    EXPECT_EQ(PhonebookWriteEntry(*link_, "SM", MakeEntry(h, "1", 129, longestName + "n")), 4);
    EXPECT_EQ(PhonebookWriteEntry(*link_, "SM", MakeEntry(h + 1, "1", 129, "x")), 4);
    EXPECT_EQ(PhonebookWriteEntry(*link_, "SM", MakeEntry(0, "1", 129, "x")), 4);
    EXPECT_EQ(PhonebookWriteEntry(*link_, "SM", MakeEntry(5, "12a4", 129, "x")), 4);
    EXPECT_EQ(PhonebookDeleteEntry(*link_, "SM", h + 1), 0);
    EXPECT_EQ(PhonebookDeleteEntry(*link_, "SM", 0), 0);
    EXPECT_NE(FinalOf(Command("AT+CPBR=0,5\r")), 0);
    EXPECT_NE(FinalOf(Command("AT+CPBR=5,4\r")), 0);
    EXPECT_NE(FinalOf(Command("AT+CPBR=1," + std::to_string(h + 1) + "\r")), 0);
    EXPECT_EQ(Text(Read(h)), longestName);  // the refused writes left it alone

    // A full book has no first free place.
    ASSERT_EQ(sim_->Control("phonebook-fill SM " + std::to_string(h)), "OK");
    EXPECT_EQ(FinalOf(Command("AT+CPBW=,\"0456\",129,\"x\"\r")), 4);
    EXPECT_EQ(sim_->Control("phonebook-add SM 0456 Late"), "ERROR: phonebook full");
}

TEST_F(SimulatedPhonebookTest, NetworkSideEntriesOutliveARestart) {
    const std::string state = temp_ / "card.state";
    Start(state);
    ASSERT_EQ(sim_->Control("phonebook-clear SM"), "OK");
    ASSERT_EQ(sim_->Control("phonebook-add SM +447700900555 Zoë de la Croix"), "OK");
    ASSERT_EQ(sim_->Control("phonebook-add SM 01632960777 Plain"), "OK");
    EXPECT_EQ(sim_->Control("phonebook-add XX 0123 Nobody").rfind("ERROR", 0), 0u);
    EXPECT_EQ(sim_->Control("phonebook-add SM 12ab Bad").rfind("ERROR", 0), 0u);
    EXPECT_EQ(sim_->Control("phonebook-fill SM 251").rfind("ERROR", 0), 0u);
    ASSERT_EQ(PhonebookDeleteEntry(*link_, "SM", 2), 1);
    Stop();

    std::ifstream file(state);
    std::stringstream text;
    text << file.rdbuf();
    EXPECT_NE(text.str().find("pb SM 1 145 +447700900555 Zoë de la Croix\n"), std::string::npos)
        << text.str();

    Start(state);
    ASSERT_EQ(PhonebookSelect(*link_, kStorageSimCard), 0);
    const std::vector<PhonebookEntry> all = ReadAll(250);
    ASSERT_EQ(all.size(), 1u);                      // the deleted one stays deleted
    EXPECT_EQ(Text(all[0]), "Zo\xEB de la Croix");  // ISO 8859-1 on the line
    EXPECT_EQ(Number(all[0]), "+447700900555");
}

}  // namespace
}  // namespace vqm
