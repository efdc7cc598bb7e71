// The phonebook caches' read side on hand-built files: the lock's access word, opening under
// it, what counts as present, and the number-to-name look-ups of both groups.
#include "contacts/phonebook_cache.h"

#include <gtest/gtest.h>

#include <atomic>
#include <cstring>
#include <filesystem>
#include <fstream>
#include <thread>
#include <vector>

#include "support/settings_store.h"
#include "tests/common/temp_folder.h"

namespace vqm {
namespace {

namespace fs = std::filesystem;

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

OutlookMobileRecord Mobile(const char* name, const char* number) {
    OutlookMobileRecord record{};
    std::strncpy(record.name, name, sizeof record.name - 1);
    std::strncpy(record.number, number, sizeof record.number - 1);
    return record;
}

OutlookNumbersRecord Numbers(const char* name, const char* first, const char* second,
                             const char* fax) {
    OutlookNumbersRecord record{};
    std::strncpy(record.name, name, sizeof record.name - 1);
    const char* numbers[3] = {first, second, fax};
    for (int i = 0; i < 3; ++i)
        std::strncpy(record.numbers[i], numbers[i], 31);
    return record;
}

class PhonebookCacheTest : public ::testing::Test {
  protected:
    PhonebookCacheTest() {
        const std::u16string folder(temp_.Path().begin(), temp_.Path().end());
        SetSettingString(settings_, u"InstallPath", folder.c_str());
        // Mutex waits only matter in the tests that hold the mutex themselves.
        caches_.sim.lock.waitMs = 20;
        caches_.outlook.lock.waitMs = 20;
    }

    template <typename Record>
    void Write(const std::string& name, const std::vector<Record>& records,
               const std::string& tail = "") const {
        std::ofstream out(temp_ / name, std::ios::binary);
        out.write(reinterpret_cast<const char*>(records.data()),
                  static_cast<std::streamsize>(records.size() * sizeof(Record)));
        out << tail;
    }

    std::u16string SimName(const char* number) {
        char16_t name[40] = u"untouched";
        if (!SimCacheFindName(caches_.sim, number, name, 40)) return u"(none)";
        return name;
    }
    std::u16string OutlookName(const char* number) {
        char16_t name[140] = u"untouched";
        if (!OutlookCacheFindName(caches_.outlook, number, name, 140)) return u"(none)";
        return name;
    }

    const testing::TempFolder temp_;
    SettingsStore settings_{temp_ / "settings.db"};
    PhonebookCaches caches_{settings_};
};

TEST_F(PhonebookCacheTest, ReadersShareWritersExcludeAndTheFirstReleaseFreesEveryone) {
    CacheLock& lock = caches_.sim.lock;
    EXPECT_EQ(CacheAcquire(lock, kCacheRead), 1);
    EXPECT_EQ(CacheAcquire(lock, kCacheRead), 1);
    EXPECT_EQ(CacheAcquire(lock, kCacheWrite), 0);
    CacheRelease(lock);  // one reader leaves: the word is free although the other reads on
    EXPECT_EQ(lock.state, kCacheFree);
    EXPECT_EQ(CacheAcquire(lock, kCacheWrite), 1);
    EXPECT_EQ(CacheAcquire(lock, kCacheRead), 0);
    EXPECT_EQ(CacheAcquire(lock, kCacheWrite), 0);
    EXPECT_EQ(lock.state, kCacheWriting);
    CacheRelease(lock);
    EXPECT_EQ(CacheAcquire(lock, 3), 0);  // no such mode
    EXPECT_EQ(lock.state, kCacheFree);
    // The groups have locks of their own.
    EXPECT_EQ(CacheAcquire(lock, kCacheWrite), 1);
    EXPECT_EQ(CacheAcquire(caches_.outlook.lock, kCacheWrite), 1);
}

TEST_F(PhonebookCacheTest, AMutexHeldPastTheWaitRefusesTheAcquireButNotTheRelease) {
    CacheLock& lock = caches_.outlook.lock;
    ASSERT_EQ(CacheAcquire(lock, kCacheWrite), 1);
    lock.mutex.lock();
    EXPECT_EQ(CacheAcquire(lock, kCacheRead), 0);
    lock.state = kCacheFree;
    EXPECT_EQ(CacheAcquire(lock, kCacheWrite), 0);  // refused by the wait, not the word
    lock.state = kCacheWriting;
    CacheRelease(lock);  // must not leave the group shut for good
    EXPECT_EQ(lock.state, kCacheFree);
    lock.mutex.unlock();
    EXPECT_EQ(CacheAcquire(lock, kCacheWrite), 1);
}

TEST_F(PhonebookCacheTest, DestroyWaitsForTheBuilderToGiveUpTheGroup) {
    CacheLock& lock = caches_.sim.lock;
    ASSERT_EQ(CacheAcquire(lock, kCacheWrite), 1);
    std::atomic<bool> builderDone{false};
    std::atomic<bool> destroyReturned{false};
    std::thread destroyer([&] {
        CacheLockDestroy(lock);
        // Only possible once the builder below has let go.
        EXPECT_TRUE(builderDone.load());
        destroyReturned = true;
    });
    builderDone = true;
    CacheRelease(lock);
    destroyer.join();
    EXPECT_TRUE(destroyReturned.load());
    EXPECT_EQ(lock.state, kCacheFree);
}

TEST_F(PhonebookCacheTest, OpenTakesTheLockForItsModeAndCloseAlwaysReleases) {
    // Refused before touching the lock.
    EXPECT_EQ(CacheOpen(caches_.sim, 0, kCacheRead), nullptr);
    EXPECT_EQ(CacheOpen(caches_.sim, 3, kCacheRead), nullptr);
    EXPECT_EQ(CacheOpen(caches_.outlook, 4, kCacheRead), nullptr);
    EXPECT_EQ(CacheOpen(caches_.sim, 1, 0), nullptr);
    EXPECT_EQ(caches_.sim.lock.state, kCacheFree);

    // A read of a missing file holds the word until closed, and creates nothing.
    EXPECT_EQ(CacheOpen(caches_.sim, 1, kCacheRead), nullptr);
    EXPECT_EQ(caches_.sim.lock.state, kCacheReading);
    EXPECT_FALSE(fs::exists(temp_ / "simphonebk1.db"));
    CacheClose(caches_.sim, nullptr);
    EXPECT_EQ(caches_.sim.lock.state, kCacheFree);

    // Writing appends.
    Write("simphonebk2.db", std::vector{Entry(1, "100", "A")});
    FILE* out = CacheOpen(caches_.sim, 2, kCacheWrite);
    ASSERT_NE(out, nullptr);
    EXPECT_EQ(caches_.sim.lock.state, kCacheWriting);
    const PhonebookEntry second = Entry(2, "200", "B");
    std::fwrite(&second, 1, sizeof second, out);
    // Another writer or a reader is refused meanwhile.
    EXPECT_EQ(CacheOpen(caches_.sim, 1, kCacheWrite), nullptr);
    CacheClose(caches_.sim, out);
    EXPECT_EQ(fs::file_size(temp_ / "simphonebk2.db"), 2 * kPhonebookEntrySize);
    EXPECT_EQ(SimName("200"), u"B");

    EXPECT_EQ(CachePath(caches_.outlook, 3), temp_ / "phonebk3.db");
    EXPECT_EQ(CachePath(caches_.sim, 1), temp_ / "simphonebk1.db");
    EXPECT_EQ(CachePath(caches_.sim, 3), "");
}

TEST_F(PhonebookCacheTest, PresenceAsksForSomeFileOfWholeRecordsEvenAnEmptyOne) {
    EXPECT_FALSE(CachePresent(caches_.sim));
    Write("simphonebk1.db", std::vector{Entry(1, "100", "A")}, std::string(40, '\0'));
    EXPECT_FALSE(CachePresent(caches_.sim));
    // The torn first file hides its whole record until the group counts as present ...
    EXPECT_EQ(SimName("100"), u"(none)");
    // ... which a zero-byte second file makes it.
    Write("simphonebk2.db", std::vector<PhonebookEntry>{});
    EXPECT_TRUE(CachePresent(caches_.sim));
    EXPECT_EQ(SimName("100"), u"A");

    // Outlook files have records of their own sizes: 160 for mobile, 224 for the others.
    Write("phonebk2.db", std::vector{Mobile("x", "1")});
    EXPECT_FALSE(CachePresent(caches_.outlook));
    Write("phonebk2.db", std::vector{Numbers("x", "1", "", "")});
    EXPECT_TRUE(CachePresent(caches_.outlook));
}

TEST_F(PhonebookCacheTest, SimNamesMatchByWholeNumberSimFirstThenCardPhone) {
    Write("simphonebk1.db", std::vector{Entry(1, "+447700900123", "Alice"), Entry(2, "0123", "Bob"),
                                        Entry(3, "555", "SIM five")});
    // Latin-1 names come out as UTF-16; the card's copy of 555 loses to the SIM's.
    Write("simphonebk2.db",
          std::vector{Entry(1, "07700900999", "Zo\xEB"), Entry(2, "555", "Card five")});
    EXPECT_EQ(SimName("+447700900123"), u"Alice");
    EXPECT_EQ(SimName("07700900999"), u"Zo\u00EB");
    EXPECT_EQ(SimName("555"), u"SIM five");
    // Same digits but not the same number: a prefix, a longer number, the other form.
    EXPECT_EQ(SimName("012"), u"(none)");
    EXPECT_EQ(SimName("01234"), u"(none)");
    EXPECT_EQ(SimName("447700900123"), u"(none)");
    EXPECT_EQ(SimName(""), u"(none)");
    EXPECT_EQ(SimCacheFindName(caches_.sim, nullptr, nullptr, 0), 0);
}

TEST_F(PhonebookCacheTest, SimRecordsAreTrustedOnlyWithinTheirFields) {
    PhonebookEntry shortText = Entry(1, "111", "Carol Long Name");
    shortText.textLength = 5;  // the name is what the length says, not the whole field
    PhonebookEntry lying = Entry(2, "222", "Dan");
    lying.numberLength = 4;  // disagrees with the number: never matches
    PhonebookEntry huge = Entry(3, "333", "");
    std::memset(huge.text, 'E', sizeof huge.text);  // no terminator at all
    huge.textLength = 1000;
    PhonebookEntry negative = Entry(4, "444", "Fay");
    negative.textLength = -3;
    Write("simphonebk1.db", std::vector{shortText, lying, huge, negative});

    EXPECT_EQ(SimName("111"), u"Carol");
    EXPECT_EQ(SimName("222"), u"(none)");
    EXPECT_EQ(SimName("333"), std::u16string(32, u'E'));
    EXPECT_EQ(SimName("444"), u"");
    // A small output gets a cut, terminated name.
    char16_t small[4];
    ASSERT_EQ(SimCacheFindName(caches_.sim, "111", small, 4), 1);
    EXPECT_EQ(std::u16string(small), u"Car");
}

TEST_F(PhonebookCacheTest, OutlookMatchesMobileAndTheFirstHomeAndWorkNumbersOnly) {
    Write("phonebk1.db", std::vector{Mobile("Mobile Mary", "07700900001")});
    Write("phonebk2.db",
          std::vector{Numbers("Home Harry", "01632960001", "01632960002", "01632960003")});
    Write("phonebk3.db",
          std::vector{Numbers("Work W\xE9nd\xFF", "02079460001", "02079460002", "02079460003")});
    EXPECT_EQ(OutlookName("07700900001"), u"Mobile Mary");
    EXPECT_EQ(OutlookName("01632960001"), u"Home Harry");
    EXPECT_EQ(OutlookName("02079460001"), u"Work W\u00E9nd\u00FF");
    for (const char* never : {"01632960002", "01632960003", "02079460002", "02079460003"})
        EXPECT_EQ(OutlookName(never), u"(none)") << never;

    // A name filling its 128 bytes without a terminator stays inside the record.
    OutlookMobileRecord full = Mobile("", "999");
    std::memset(full.name, 'N', sizeof full.name);
    Write("phonebk1.db", std::vector{full});
    EXPECT_EQ(OutlookName("999"), std::u16string(128, u'N'));
}

TEST_F(PhonebookCacheTest, ALookupDuringARebuildFindsNothing) {
    Write("simphonebk1.db", std::vector{Entry(1, "100", "A")});
    ASSERT_EQ(CacheAcquire(caches_.sim.lock, kCacheWrite), 1);
    EXPECT_EQ(SimName("100"), u"(none)");
    CacheRelease(caches_.sim.lock);
    EXPECT_EQ(SimName("100"), u"A");

    // The whole look-up tries the SIM group, then Outlook.
    Write("phonebk1.db", std::vector{Mobile("From Outlook", "100"), Mobile("Only Outlook", "7")});
    char16_t name[140];
    ASSERT_EQ(FindNameByNumber(caches_, "100", name, 140), 1);
    EXPECT_EQ(std::u16string(name), u"A");
    ASSERT_EQ(FindNameByNumber(caches_, "7", name, 140), 1);
    EXPECT_EQ(std::u16string(name), u"Only Outlook");
    EXPECT_EQ(FindNameByNumber(caches_, "8", name, 140), 0);
}

TEST_F(PhonebookCacheTest, LookupsBesideAWriterSeeOnlyWholeRecords) {
    caches_.sim.lock.waitMs = 500;
    Write("simphonebk1.db", std::vector<PhonebookEntry>{});
    std::atomic<bool> stop{false};
    std::atomic<int> wrong{0};
    std::vector<std::thread> readers;
    for (int r = 0; r < 3; ++r)
        readers.emplace_back([&] {
            while (!stop) {
                char16_t name[40];
                // Found or not, a found name is always the right one.
                if (SimCacheFindName(caches_.sim, "5", name, 40) && std::u16string(name) != u"Five")
                    ++wrong;
            }
        });
    for (int i = 0; i < 200; ++i) {
        FILE* out = nullptr;
        while (!(out = CacheOpen(caches_.sim, 1, kCacheWrite)))
            CacheClose(caches_.sim, nullptr);
        const PhonebookEntry entry = Entry(i + 1, i == 150 ? "5" : "6", i == 150 ? "Five" : "x");
        std::fwrite(&entry, 1, sizeof entry, out);
        CacheClose(caches_.sim, out);
    }
    stop = true;
    for (auto& t : readers)
        t.join();
    EXPECT_EQ(wrong.load(), 0);
    EXPECT_EQ(SimName("5"), u"Five");
}

}  // namespace
}  // namespace vqm
