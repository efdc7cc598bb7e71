// The phonebook caches' write side: the SIM group's record edits through the ".tmp" copy, the
// SIM builder against a scripted card and the simulated card (runs of ten, stopping at the used
// count, a pulled card), the load and clear reporters, and the address-book builder's files.
#include "contacts/cache_builders.h"

#include <gtest/gtest.h>

#include <chrono>
#include <condition_variable>
#include <cstring>
#include <filesystem>
#include <fstream>
#include <map>
#include <memory>
#include <mutex>
#include <string>
#include <thread>
#include <vector>

#include "cardsim/card_sim.h"
#include "contacts/phonebook_at.h"
#include "link/link.h"
#include "support/settings_store.h"
#include "tests/common/fake_card.h"
#include "tests/common/link_waits.h"
#include "tests/common/temp_folder.h"

namespace vqm {
namespace {

namespace fs = std::filesystem;
using Commands = std::vector<std::string>;

PhonebookEntry Entry(int index, const char* number, const char* text) {
    PhonebookEntry entry{};
    entry.index = index;
    entry.type = number[0] == '+' ? 145 : 129;
    std::strncpy(entry.number, number, sizeof entry.number - 1);
    std::strncpy(entry.text, text, sizeof entry.text - 1);
    entry.numberLength = static_cast<int32_t>(std::strlen(entry.number));
    entry.textLength = static_cast<int32_t>(std::strlen(entry.text));
    return entry;
}

template <typename Record>
std::vector<Record> ReadRecords(const std::string& path) {
    std::vector<Record> records;
    std::ifstream in(path, std::ios::binary);
    Record record;
    while (in.read(reinterpret_cast<char*>(&record), sizeof record))
        records.push_back(record);
    return records;
}

// One folder, one settings store and the caches over them; a scripted card that records the
// phonebook commands and answers them from a table; what the builders report.
class CacheBuildersTest : public ::testing::Test {
  protected:
    CacheBuildersTest()
        : card_([this](const std::string& command) {
              std::lock_guard<std::mutex> lock(mutex_);
              if (command.find("+CPB") == std::string::npos) return std::string("\r\nOK\r\n");
              sent_.push_back(command);
              if (pullAt_ > 0 && static_cast<int>(sent_.size()) > pullAt_) {
                  card_.Pull();  // the device is gone: the link's reads fail from now on
                  return std::string();
              }
              auto it = answers_.find(command);
              return it != answers_.end() ? it->second : std::string("\r\nOK\r\n");
          }) {
        SetSettingString(settings_, u"InstallPath",
                         std::u16string(temp_.Path().begin(), temp_.Path().end()).c_str());
        caches_.sim.lock.waitMs = 20;
        caches_.outlook.lock.waitMs = 20;
        caches_.pause = [this](int ms) {
            std::lock_guard<std::mutex> lock(mutex_);
            pauses_.push_back(ms);
        };
        link_ = MakeLink();
    }
    ~CacheBuildersTest() override {
        caches_.workers.JoinAll();
        if (link_) PortClose(*link_);
    }

    std::unique_ptr<Link> MakeLink() {
        auto link = std::make_unique<Link>(settings_, DriverRoots{temp_ / "run", temp_ / "tty"});
        testing::ShortenLinkWaits(*link);
        return link;
    }
    void OpenScripted() { ASSERT_EQ(PortOpenDevice(*link_, card_.Device().c_str()), 1); }

    void Answer(const std::string& command, const std::string& reply) {
        std::lock_guard<std::mutex> lock(mutex_);
        answers_[command] = reply;
    }
    Commands Sent() {
        std::lock_guard<std::mutex> lock(mutex_);
        return sent_;
    }
    // The simulated card with its demo books, powered and on the link.
    void StartDemoCard(std::unique_ptr<cardsim::CardSim>* sim) {
        cardsim::SimConfig config;
        config.baud = 0;
        config.runtimeDir = temp_ / "sim";
        config.stateFile = temp_ / "card.state";
        *sim = std::make_unique<cardsim::CardSim>(config);
        ASSERT_TRUE((*sim)->PowerUp());
        ASSERT_EQ(PortOpenDevice(*link_, (*sim)->DevicePath().c_str()), 1);
    }
    CacheNotify Notifier() {
        return [this](unsigned msg) {
            std::lock_guard<std::mutex> lock(mutex_);
            reports_.push_back(msg);
            reported_.notify_all();
        };
    }
    // Waits (at most 20 s) until count reports have come.
    std::vector<unsigned> WaitReports(size_t count) {
        std::unique_lock<std::mutex> lock(mutex_);
        reported_.wait_for(lock, std::chrono::seconds(20),
                           [&] { return reports_.size() >= count; });
        return reports_;
    }
    std::string Path(const char* name) const { return temp_ / name; }
    std::vector<PhonebookEntry> SimFile(int n) {
        return ReadRecords<PhonebookEntry>(CachePath(caches_.sim, n));
    }
    void WriteSim(int n, const std::vector<PhonebookEntry>& entries) {
        std::ofstream out(CachePath(caches_.sim, n), std::ios::binary | std::ios::trunc);
        out.write(reinterpret_cast<const char*>(entries.data()),
                  static_cast<std::streamsize>(entries.size() * sizeof(PhonebookEntry)));
    }

    const testing::TempFolder temp_;
    SettingsStore settings_{temp_ / "settings.db"};
    PhonebookCaches caches_{settings_};
    std::mutex mutex_;
    std::condition_variable reported_;
    std::map<std::string, std::string> answers_;
    Commands sent_;
    std::vector<int> pauses_;
    std::vector<unsigned> reports_;
    int pullAt_ = 0;  // phonebook commands answered before the card falls silent
    testing::FakeCard card_;
    std::unique_ptr<Link> link_;
};

// Record edits

TEST_F(CacheBuildersTest, NextFreeIndexIsTheFirstGap) {
    struct Case {
        std::vector<int> indices;
        int expected;
    };
    std::vector<int> all;
    for (int i = 0; i < 600; ++i)
        all.push_back(i);  // 0 and indices past 511 are marked or ignored, never returned
    const Case cases[] = {{{1, 2, 4}, 3}, {{}, 1}, {{2, 3}, 1}, {{1, 1, 2}, 3}, {all, 0}};
    for (const Case& c : cases) {
        std::vector<PhonebookEntry> entries;
        for (int index : c.indices)
            entries.push_back(Entry(index, "1", "x"));
        WriteSim(1, entries);
        EXPECT_EQ(SimCacheNextFreeIndex(caches_.sim, 1), c.expected) << c.indices.size();
    }
    fs::remove(CachePath(caches_.sim, 2));
    EXPECT_EQ(SimCacheNextFreeIndex(caches_.sim, 2), 1);  // no file at all
}

TEST_F(CacheBuildersTest, AppendReplaceAndRemoveGoThroughTheTemporaryCopy) {
    ASSERT_EQ(SimCacheAppend(caches_.sim, 1, Entry(1, "111", "Ann")), 1);
    ASSERT_EQ(SimCacheAppend(caches_.sim, 1, Entry(2, "222", "Bob")), 1);
    ASSERT_EQ(SimCacheAppend(caches_.sim, 1, Entry(3, "333", "Cy")), 1);

    EXPECT_EQ(SimCacheReplace(caches_.sim, 1, Entry(2, "+4922", "Bobby")), 1);
    std::vector<PhonebookEntry> file = SimFile(1);
    ASSERT_EQ(file.size(), 3u);
    EXPECT_STREQ(file[1].text, "Bobby");
    EXPECT_EQ(file[1].type, 145);
    EXPECT_STREQ(file[2].text, "Cy");
    EXPECT_FALSE(fs::exists(CachePath(caches_.sim, 1) + ".tmp"));

    EXPECT_EQ(SimCacheRemove(caches_.sim, 1, 0), 0);  // no index 0 to remove
    EXPECT_EQ(SimCacheRemove(caches_.sim, 1, 1), 1);
    EXPECT_EQ(SimFile(1).size(), 2u);
    EXPECT_EQ(SimCacheNextFreeIndex(caches_.sim, 1), 1);
    EXPECT_EQ(SimCacheRemove(caches_.sim, 1, 2), 1);
    EXPECT_EQ(SimCacheRemove(caches_.sim, 1, 3), 1);
    EXPECT_FALSE(fs::exists(CachePath(caches_.sim, 1)));  // the last record took the file along

    // Nothing to copy from: refused, and no copy left behind.
    EXPECT_EQ(SimCacheReplace(caches_.sim, 1, Entry(1, "1", "x")), 0);
    EXPECT_FALSE(fs::exists(CachePath(caches_.sim, 1) + ".tmp"));

    // A builder in the write state keeps every edit out. A refused append still releases
    // the lock (its close always does), which frees the group for whoever comes next.
    SimCacheAppend(caches_.sim, 2, Entry(1, "1", "x"));
    ASSERT_EQ(CacheAcquire(caches_.sim.lock, kCacheWrite), 1);
    EXPECT_EQ(SimCacheReplace(caches_.sim, 2, Entry(1, "9", "z")), 0);
    EXPECT_EQ(SimCacheRemove(caches_.sim, 2, 1), 0);
    EXPECT_EQ(caches_.sim.lock.state.load(), kCacheWriting);
    EXPECT_EQ(SimCacheAppend(caches_.sim, 2, Entry(2, "2", "y")), 0);
    EXPECT_EQ(caches_.sim.lock.state.load(), kCacheFree);
    ASSERT_EQ(SimFile(2).size(), 1u);
    EXPECT_STREQ(SimFile(2)[0].number, "1");
}

TEST_F(CacheBuildersTest, ACrashedReplaceLeavesTheOldFileWhole) {
    SimCacheAppend(caches_.sim, 1, Entry(1, "111", "Ann"));
    SimCacheAppend(caches_.sim, 1, Entry(2, "222", "Bob"));
    // A dialer killed while copying leaves a partial ".tmp"; the file itself is untouched and
    // the next edit writes its copy afresh.
    {
        std::ofstream partial(CachePath(caches_.sim, 1) + ".tmp", std::ios::binary);
        partial << "half a record";
    }
    EXPECT_TRUE(CachePresent(caches_.sim));
    EXPECT_EQ(SimCacheReplace(caches_.sim, 1, Entry(1, "999", "Ann")), 1);
    std::vector<PhonebookEntry> file = SimFile(1);
    ASSERT_EQ(file.size(), 2u);
    EXPECT_STREQ(file[0].number, "999");
    EXPECT_STREQ(file[1].number, "222");

    // An append killed part-way leaves part of a record; the next append starts on the grid.
    {
        std::ofstream cut(CachePath(caches_.sim, 1), std::ios::binary | std::ios::app);
        cut << "half a record";
    }
    EXPECT_EQ(SimCacheAppend(caches_.sim, 1, Entry(3, "333", "Cy")), 1);
    file = SimFile(1);
    ASSERT_EQ(file.size(), 3u);
    EXPECT_STREQ(file[2].number, "333");
    EXPECT_EQ(fs::file_size(CachePath(caches_.sim, 1)), 3 * sizeof(PhonebookEntry));
}

// The SIM builder against a scripted card

TEST_F(CacheBuildersTest, UsedEntriesInTheFirstRunNeedOneRangeCommand) {
    OpenScripted();
    Answer("AT+CPBS?", "\r\n+CPBS: \"SM\",3,25\r\n\r\nOK\r\n");
    Answer("AT+CPBR=1,10",
           "\r\n+CPBR: 1,\"111\",129,\"Ann\"\r\n\r\n+CPBR: 4,\"+444\",145,\"Bob\"\r\n"
           "\r\n+CPBR: 9,\"999\",129,\"Cy\"\r\n\r\nOK\r\n");
    Answer("AT+CPBS=\"ME\"", "\r\nERROR\r\n");
    SimCacheBuild(caches_, *link_, Notifier());
    EXPECT_EQ(Sent(), (Commands{"AT+CPBS=\"SM\"", "AT+CPBS?", "AT+CPBR=1,10", "AT+CPBS=\"ME\""}));
    EXPECT_EQ(WaitReports(1), std::vector<unsigned>{kSimCacheDone});
    const std::vector<PhonebookEntry> file = SimFile(1);
    ASSERT_EQ(file.size(), 3u);
    EXPECT_EQ(file[1].index, 4);
    EXPECT_EQ(file[1].type, 145);
    EXPECT_FALSE(fs::exists(CachePath(caches_.sim, 2)));  // the failed select ended the build
    EXPECT_EQ(pauses_, std::vector<int>{500});
    EXPECT_EQ(caches_.sim.lock.state.load(), kCacheFree);
}

TEST_F(CacheBuildersTest, RunsOfTenUpToTheTotalUntilTheUsedCountIsRead) {
    OpenScripted();
    Answer("AT+CPBS?", "\r\n+CPBS: \"SM\",2,25\r\n\r\nOK\r\n");
    Answer("AT+CPBR=21,25", "\r\n+CPBR: 25,\"25\",129,\"Last\"\r\n\r\nOK\r\n");
    Answer("AT+CPBR=11,20", "\r\n+CPBR: 12,\"12\",129,\"Mid\"\r\n\r\nOK\r\n");
    SimCacheBuild(caches_, *link_, Notifier());
    const Commands sent = Sent();
    // SM: 1-10 empty, 11-20 one, 21-25 the second; ME answers the same usage and stops early.
    const Commands expected{"AT+CPBS=\"SM\"", "AT+CPBS?",       "AT+CPBR=1,10", "AT+CPBR=11,20",
                            "AT+CPBR=21,25",  "AT+CPBS=\"ME\"", "AT+CPBS?",     "AT+CPBR=1,10",
                            "AT+CPBR=11,20",  "AT+CPBR=21,25"};
    EXPECT_EQ(sent, expected);
    EXPECT_EQ(SimFile(1).size(), 2u);
    EXPECT_EQ(SimFile(2).size(), 2u);
    EXPECT_EQ(pauses_, (std::vector<int>{500, 500}));
}

TEST_F(CacheBuildersTest, APulledCardEndsTheBuildWithWhatWasRead) {
    OpenScripted();
    Answer("AT+CPBS?", "\r\n+CPBS: \"SM\",30,250\r\n\r\nOK\r\n");
    std::string run;
    for (int i = 1; i <= 10; ++i)
        run += "\r\n+CPBR: " + std::to_string(i) + ",\"" + std::to_string(i) + "\",129,\"N\"\r\n";
    Answer("AT+CPBR=1,10", run + "\r\nOK\r\n");
    {
        std::lock_guard<std::mutex> lock(mutex_);
        pullAt_ = 3;  // select, usage and the first run answer; then the card is gone
    }
    SimCacheBuild(caches_, *link_, Notifier());
    EXPECT_EQ(WaitReports(1), std::vector<unsigned>{kSimCacheDone});
    EXPECT_EQ(SimFile(1).size(), 10u);
    EXPECT_EQ(Sent().size(), 4u);  // no run after the silent one, no Card Phone
    EXPECT_EQ(caches_.sim.lock.state.load(), kCacheFree);

    // The next build, on the card put back, starts from nothing.
    PortClose(*link_);
    testing::FakeCard again([](const std::string& command) -> std::string {
        if (command == "AT+CPBS?") return "\r\n+CPBS: \"SM\",1,250\r\n\r\nOK\r\n";
        if (command == "AT+CPBR=1,10") return "\r\n+CPBR: 3,\"3\",129,\"N\"\r\n\r\nOK\r\n";
        return "\r\nOK\r\n";
    });
    ASSERT_EQ(PortOpenDevice(*link_, again.Device().c_str()), 1);
    SimCacheRebuild(caches_, *link_, Notifier());
    WaitReports(2);
    caches_.workers.JoinAll();
    EXPECT_EQ(SimFile(1).size(), 1u);
    EXPECT_EQ(SimFile(2).size(), 1u);
    PortClose(*link_);
}

TEST_F(CacheBuildersTest, ABusyGroupIsReportedDoneWithoutACommand) {
    OpenScripted();
    ASSERT_EQ(CacheAcquire(caches_.sim.lock, kCacheRead), 1);
    SimCacheBuild(caches_, *link_, Notifier());
    EXPECT_EQ(WaitReports(1), std::vector<unsigned>{kSimCacheDone});
    EXPECT_TRUE(Sent().empty());
    CacheRelease(caches_.sim.lock);
}

TEST_F(CacheBuildersTest, APresentCacheIsReportedWithoutTheCard) {
    OpenScripted();
    struct Case {
        std::string content;  // of simphonebk1.db
        bool built;
    };
    const Case cases[] = {
        {"", false},                                        // empty but present
        {std::string(kPhonebookEntrySize, 'x'), false},     // one record
        {std::string(kPhonebookEntrySize + 3, 'x'), true},  // damaged: not a cache
    };
    size_t reports = 0;
    for (const Case& c : cases) {
        {
            std::ofstream out(CachePath(caches_.sim, 1), std::ios::binary | std::ios::trunc);
            out << c.content;
        }
        fs::remove(CachePath(caches_.sim, 2));
        {
            std::lock_guard<std::mutex> lock(mutex_);
            sent_.clear();
            pauses_.clear();
        }
        SimCacheLoad(caches_, *link_, Notifier());
        EXPECT_EQ(WaitReports(++reports).back(), kSimCacheDone);
        caches_.workers.JoinAll();
        EXPECT_EQ(!Sent().empty(), c.built) << c.content.size();
        if (!c.built) {
            EXPECT_EQ(pauses_, std::vector<int>{500});
        }
    }
}

// The SIM builder against the simulated card

TEST_F(CacheBuildersTest, TheDemoSimIsCopiedWholeAndLookedUpByNumber) {
    std::unique_ptr<cardsim::CardSim> sim;
    ASSERT_NO_FATAL_FAILURE(StartDemoCard(&sim));
    ASSERT_EQ(PhonebookSelect(*link_, kStorageSimCard), 0);
    int32_t used = 0, total = 0;
    ASSERT_EQ(PhonebookGetUsage(*link_, &used, &total), 1);
    ASSERT_GT(used, 0);

    SimCacheRebuild(caches_, *link_, Notifier());
    EXPECT_EQ(WaitReports(1), std::vector<unsigned>{kSimCacheDone});
    caches_.workers.JoinAll();
    const std::vector<PhonebookEntry> file = SimFile(1);
    ASSERT_EQ(static_cast<int>(file.size()), used);
    char16_t name[40];
    ASSERT_EQ(SimCacheFindName(caches_.sim, file.back().number, name, 40), 1);
    EXPECT_EQ(std::u16string(name).size(), static_cast<size_t>(file.back().textLength));
    EXPECT_FALSE(SimFile(2).empty());
}

// Whatever the files held before, a build leaves exactly the card's books: stray bytes of a
// damaged file, which no load takes for a cache, and records of an earlier run go first.
TEST_F(CacheBuildersTest, ABuildStartsFromEmptyFiles) {
    std::unique_ptr<cardsim::CardSim> sim;
    ASSERT_NO_FATAL_FAILURE(StartDemoCard(&sim));
    int32_t simUsed = 0, cardUsed = 0, total = 0;
    ASSERT_EQ(PhonebookSelect(*link_, kStorageSimCard), 0);
    ASSERT_EQ(PhonebookGetUsage(*link_, &simUsed, &total), 1);
    ASSERT_EQ(PhonebookSelect(*link_, kStorageCardPhone), 0);
    ASSERT_EQ(PhonebookGetUsage(*link_, &cardUsed, &total), 1);

    const std::string record(kPhonebookEntrySize, '\x01');
    enum class Run { Build, Load, Rebuild };
    struct Case {
        const char* what;
        std::string file1, file2;
        Run run;
    };
    const Case cases[] = {
        {"a damaged SIM file, rebuilt", record + record + "junk", "", Run::Rebuild},
        {"a damaged SIM file beside a good Card Phone file, rebuilt", "junk", record, Run::Rebuild},
        {"a damaged Card Phone file alone, loaded", "", "xyz", Run::Load},
        {"an earlier run's records, built again", record + record + record, record, Run::Build},
    };
    // Between the books a started build counts as building; one run on the caller's thread
    // is the caller's own business.
    std::vector<bool> building;
    caches_.pause = [&](int) {
        std::lock_guard<std::mutex> lock(mutex_);
        building.push_back(SimCacheBuilding(caches_));
    };
    size_t reports = 0;
    for (const Case& c : cases) {
        SCOPED_TRACE(c.what);
        {
            std::lock_guard<std::mutex> lock(mutex_);
            building.clear();
        }
        for (int n = 1; n <= 2; ++n) {
            const std::string& content = n == 1 ? c.file1 : c.file2;
            fs::remove(CachePath(caches_.sim, n));
            if (!content.empty())
                std::ofstream(CachePath(caches_.sim, n), std::ios::binary) << content;
        }
        if (c.run == Run::Build) SimCacheBuild(caches_, *link_, Notifier());
        if (c.run == Run::Load) SimCacheLoad(caches_, *link_, Notifier());
        if (c.run == Run::Rebuild) SimCacheRebuild(caches_, *link_, Notifier());
        EXPECT_EQ(WaitReports(++reports).back(), kSimCacheDone);
        caches_.workers.JoinAll();
        EXPECT_FALSE(SimCacheBuilding(caches_));
        EXPECT_EQ(building, std::vector<bool>(2, c.run != Run::Build));
        for (int n = 1; n <= 2; ++n) {
            SCOPED_TRACE(n);
            std::error_code error;
            const auto bytes = fs::file_size(CachePath(caches_.sim, n), error);
            ASSERT_FALSE(error);
            EXPECT_EQ(bytes % kPhonebookEntrySize, 0u);
            EXPECT_EQ(static_cast<int>(SimFile(n).size()), n == 1 ? simUsed : cardUsed);
        }
        EXPECT_TRUE(CachePresent(caches_.sim));
    }
    PortClose(*link_);
}

TEST_F(CacheBuildersTest, ACardPulledBetweenTheBooksLeavesTheSimBookWhole) {
    std::unique_ptr<cardsim::CardSim> sim;
    ASSERT_NO_FATAL_FAILURE(StartDemoCard(&sim));
    ASSERT_EQ(sim->Control("phonebook-fill SM 250"), "OK");
    // The pause after the SIM's book is where the card goes.
    caches_.pause = [&sim](int) { sim->Control("pull"); };
    SimCacheBuild(caches_, *link_, Notifier());
    EXPECT_EQ(WaitReports(1), std::vector<unsigned>{kSimCacheDone});
    EXPECT_EQ(SimFile(1).size(), 250u);
    EXPECT_TRUE(SimFile(2).empty());
    EXPECT_EQ(caches_.sim.lock.state.load(), kCacheFree);
    PortClose(*link_);
}

// The address-book builder

AddressBookContact Contact(std::u16string name, std::u16string mobile, std::u16string home = {},
                           std::u16string businessFax = {}) {
    AddressBookContact c;
    c.fileAs = std::move(name);
    c.mobile = std::move(mobile);
    c.home = std::move(home);
    c.businessFax = std::move(businessFax);
    return c;
}

TEST_F(CacheBuildersTest, EachContactGoesToTheFilesOfItsNumbers) {
    AddressBookResult book;
    book.opened = true;
    book.contacts = {
        Contact(u"Mobile Only", u"+49 (171) 555-01"),
        Contact(u"Fax Only", u"", u"", u"0800 123"),
        Contact(std::u16string(140, u'n'), u"1", u"2"),
        Contact(u"No Number", u""),
    };
    std::vector<std::u16string> boxes;
    OutlookCacheBuild(
        caches_, [&] { return book; }, [&](const std::u16string& t) { boxes.push_back(t); },
        Notifier());
    EXPECT_EQ(WaitReports(1), std::vector<unsigned>{kOutlookCacheDone});
    EXPECT_TRUE(boxes.empty());
    const auto mobile = ReadRecords<OutlookMobileRecord>(CachePath(caches_.outlook, 1));
    const auto home = ReadRecords<OutlookNumbersRecord>(CachePath(caches_.outlook, 2));
    const auto work = ReadRecords<OutlookNumbersRecord>(CachePath(caches_.outlook, 3));
    ASSERT_EQ(mobile.size(), 2u);
    EXPECT_STREQ(mobile[0].number, "+4917155501");                    // only what can be dialled
    EXPECT_EQ(strnlen(mobile[1].name, sizeof mobile[1].name), 127u);  // cut to 127 bytes
    ASSERT_EQ(home.size(), 1u);
    EXPECT_STREQ(home[0].numbers[0], "2");
    ASSERT_EQ(work.size(), 1u);
    EXPECT_STREQ(work[0].name, "Fax Only");
    EXPECT_STREQ(work[0].numbers[0], "");
    EXPECT_STREQ(work[0].numbers[1], "");
    EXPECT_STREQ(work[0].numbers[2], "0800123");
    char16_t name[140];
    ASSERT_EQ(OutlookCacheFindName(caches_.outlook, "+4917155501", name, 140), 1);
    EXPECT_EQ(std::u16string(name), u"Mobile Only");
    EXPECT_EQ(OutlookCacheFindName(caches_.outlook, "0800123", name, 140), 0);  // faxes never
}

TEST_F(CacheBuildersTest, AnEmptyOrMissingAddressBookWritesNothing) {
    struct Case {
        AddressBookResult book;
        std::vector<std::u16string> boxes;
    };
    AddressBookResult empty;
    empty.opened = true;
    AddressBookResult missing;
    missing.missingLibrary = kEbookContactsLibrary;
    const Case cases[] = {{empty, {}},
                          {missing, {u"libebook-contacts-1.2.so.4 is missing."}},
                          {AddressBookResult{}, {}}};
    size_t reports = 0;
    for (const Case& c : cases) {
        std::vector<std::u16string> boxes;
        // A builder of the SIM group does not matter; one of this group would.
        ASSERT_EQ(CacheAcquire(caches_.sim.lock, kCacheWrite), 1);
        OutlookCacheBuild(
            caches_, [&] { return c.book; }, [&](const std::u16string& t) { boxes.push_back(t); },
            Notifier());
        CacheRelease(caches_.sim.lock);
        EXPECT_EQ(WaitReports(++reports).back(), kOutlookCacheDone);
        EXPECT_EQ(boxes, c.boxes);
        EXPECT_FALSE(CachePresent(caches_.outlook));
    }
}

TEST_F(CacheBuildersTest, ClearAndRebuildDeleteAPresentCacheFirst) {
    {
        std::ofstream out(CachePath(caches_.outlook, 2), std::ios::binary);
        out << std::string(kOutlookNumbersRecordSize, 'a');
    }
    OutlookCacheClear(caches_, Notifier());
    EXPECT_FALSE(CachePresent(caches_.outlook));
    EXPECT_EQ(WaitReports(1).back(), kOutlookCacheDone);

    AddressBookResult book;
    book.opened = true;
    book.contacts = {Contact(u"A", u"1")};
    OutlookCacheRebuild(
        caches_, [&] { return book; }, {}, Notifier());
    EXPECT_EQ(WaitReports(2).back(), kOutlookCacheDone);
    caches_.workers.JoinAll();
    OutlookCacheRebuild(
        caches_, [&] { return book; }, {}, Notifier());
    WaitReports(3);
    caches_.workers.JoinAll();
    // Rebuilt from nothing, not appended to the first build.
    EXPECT_EQ(ReadRecords<OutlookMobileRecord>(CachePath(caches_.outlook, 1)).size(), 1u);
}

}  // namespace
}  // namespace vqm
