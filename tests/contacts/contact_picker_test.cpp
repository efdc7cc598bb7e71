// The contact picker's logic: the rows of its five pages from the cache files, the recipients
// text of its OK, and what it asks of the caches as it comes up.
#include "contacts/contact_picker.h"

#include <gtest/gtest.h>

#include <cstdio>
#include <cstring>
#include <filesystem>
#include <string>
#include <vector>

#include "support/settings_store.h"
#include "support/text.h"
#include "tests/common/temp_folder.h"

namespace vqm {
namespace {

class ContactPickerTest : public ::testing::Test {
  protected:
    ContactPickerTest() {
        SetSettingString(settings_, u"InstallPath", Utf8ToUtf16(install_).c_str());
        std::filesystem::create_directories(install_);
        caches_.sim.lock.waitMs = 20;
        caches_.outlook.lock.waitMs = 20;
    }

    void Sim(const char* file, const std::vector<std::pair<const char*, const char*>>& entries) {
        std::vector<PhonebookEntry> records;
        int index = 1;
        for (const auto& [name, number] : entries) {
            PhonebookEntry entry{};
            entry.index = index++;
            entry.type = number[0] == '+' ? 145 : 129;
            std::snprintf(entry.number, sizeof entry.number, "%s", number);
            std::snprintf(entry.text, sizeof entry.text, "%s", name);
            entry.numberLength = static_cast<int32_t>(std::strlen(entry.number));
            entry.textLength = static_cast<int32_t>(std::strlen(entry.text));
            records.push_back(entry);
        }
        Write(file, records.data(), records.size() * sizeof(PhonebookEntry));
    }
    void Mobile(const std::vector<std::pair<const char*, const char*>>& entries) {
        std::vector<OutlookMobileRecord> records;
        for (const auto& [name, number] : entries) {
            OutlookMobileRecord record{};
            std::snprintf(record.name, sizeof record.name, "%s", name);
            std::snprintf(record.number, sizeof record.number, "%s", number);
            records.push_back(record);
        }
        Write("phonebk1.db", records.data(), records.size() * sizeof(OutlookMobileRecord));
    }
    struct Numbers {
        const char* name;
        const char* first;
        const char* second;
        const char* fax;
    };
    void Home(const char* file, const std::vector<Numbers>& entries) {
        std::vector<OutlookNumbersRecord> records;
        for (const Numbers& n : entries) {
            OutlookNumbersRecord record{};
            std::snprintf(record.name, sizeof record.name, "%s", n.name);
            std::snprintf(record.numbers[0], kOutlookNumberSize, "%s", n.first);
            std::snprintf(record.numbers[1], kOutlookNumberSize, "%s", n.second);
            std::snprintf(record.numbers[2], kOutlookNumberSize, "%s", n.fax);
            records.push_back(record);
        }
        Write(file, records.data(), records.size() * sizeof(OutlookNumbersRecord));
    }
    void Write(const char* file, const void* data, size_t size) {
        FILE* stream = std::fopen((install_ + file).c_str(), "wb");
        ASSERT_NE(stream, nullptr);
        std::fwrite(data, 1, size, stream);
        std::fclose(stream);
    }
    std::vector<std::string> Shown(int page) {
        std::vector<PickerRow> rows;
        EXPECT_TRUE(LoadPickerRows(caches_, page, &rows));
        std::vector<std::string> shown;
        for (const PickerRow& row : rows)
            shown.push_back(Utf16ToUtf8(row.name) + "|" + Utf16ToUtf8(row.number));
        return shown;
    }

    const testing::TempFolder temp_;
    const std::string install_ = temp_ / "install/";
    SettingsStore settings_{temp_ / "settings.db"};
    PhonebookCaches caches_{settings_};
};

TEST_F(ContactPickerTest, EachPageListsItsFileByItsRuleSortedByName) {
    Sim("simphonebk1.db", {{"carol", "333"}, {"Alice Smith", "+447700900123"}, {"bob", "222"}});
    Sim("simphonebk2.db", {{"Zed", "9"}, {"Card Amy", "+301"}});
    Mobile({{"Mo", "07700"}, {"No Mobile", ""}, {"Al\xe9", "07701"}});
    Home("phonebk2.db", {{"Fax Only", "", "", "0208"},
                         {"Second Only", "", "0207", ""},
                         {"Dan", "0201", "0202", "0203"}});
    Home("phonebk3.db", {{"Worker", "0301", "", ""}, {"Nobody", "", "", ""}});
    struct Case {
        int page;
        std::vector<std::string> rows;
    } cases[] = {
        {kPickerSimPage, {"Alice Smith|+447700900123", "bob|222", "carol|333"}},
        {kPickerCardPage, {"Card Amy|+301", "Zed|9"}},
        {kPickerMobilePage, {"Al\xc3\xa9|07701", "Mo|07700"}},  // ISO 8859-1 names widened
        {kPickerHomePage, {"Dan|0201"}},  // only the first number; a fax alone is left off
        {kPickerWorkPage, {"Worker|0301"}},
    };
    for (const Case& c : cases) {
        SCOPED_TRACE(c.page);
        EXPECT_EQ(Shown(c.page), c.rows);
    }
    // No file: an empty page. A builder writing the group: refused, empty.
    std::filesystem::remove(install_ + "phonebk3.db");
    EXPECT_TRUE(Shown(kPickerWorkPage).empty());
    ASSERT_EQ(CacheAcquire(caches_.sim.lock, kCacheWrite), 1);
    std::vector<PickerRow> rows{{u"stale", u"1"}};
    EXPECT_FALSE(LoadPickerRows(caches_, kPickerSimPage, &rows));
    EXPECT_TRUE(rows.empty());
    CacheRelease(caches_.sim.lock);
}

TEST_F(ContactPickerTest, OkTextTakesTickedRowsPageByPageInRowOrder) {
    PickerRows rows;
    rows[kPickerSimPage] = {{u"Alice", u"+447700900123"}, {u"Bob", u"222"}};
    rows[kPickerHomePage] = {{u"Dan", u"0201"}};
    rows[kPickerWorkPage] = {{std::u16string(70, u'n'), std::u16string(40, u'5')}};
    struct Case {
        std::vector<std::pair<int, int>> ticked;  // page, row
        std::u16string text;
    } cases[] = {
        {{}, u""},  // nothing ticked: nothing added to what the field holds
        {{{kPickerHomePage, 0}, {kPickerSimPage, 1}}, u"Bob<222>;\r\nDan<0201>;\r\n"},
        {{{kPickerSimPage, 1}, {kPickerSimPage, 0}}, u"Alice<+447700900123>;\r\nBob<222>;\r\n"},
        {{{kPickerWorkPage, 0}},
         std::u16string(64, u'n') + u"<" + std::u16string(32, u'5') + u">;\r\n"},
    };
    for (const Case& c : cases) {
        PickerTicks ticks;
        for (int page = 0; page < kPickerPageCount; ++page)
            ticks[page].assign(rows[page].size(), false);
        for (const auto& [page, row] : c.ticked)
            ticks[page][static_cast<size_t>(row)] = true;
        EXPECT_EQ(PickedRecipients(rows, ticks), c.text);
    }
}

TEST_F(ContactPickerTest, ActivationClearsTheAddressBookThenLoadsTheSimOnce) {
    PickerLoadState state;
    // Card not ready yet: the address book is cleared, the SIM waits for the card.
    EXPECT_EQ(PickerActivated(state, 1, "a"), kPickerOutlookClear);
    EXPECT_EQ(PickerOutlookDone(state, 1), kPickerReloadOutlook);
    EXPECT_EQ(PickerActivated(state, 1, "a"), kPickerClearTicks);
    EXPECT_EQ(PickerActivated(state, 2, "a"), kPickerSimLoad | kPickerClearTicks);
    EXPECT_EQ(PickerActivated(state, 2, "a"), kPickerNoWork);  // still loading
    EXPECT_EQ(PickerSimDone(state, "b"), kPickerReloadSim);
    EXPECT_TRUE(state.loaded);
    // Loaded: the same caches only lose their ticks; changed ones are read again.
    EXPECT_EQ(PickerActivated(state, 2, "b"), kPickerClearTicks);
    EXPECT_EQ(PickerActivated(state, 2, "c"), kPickerReloadOutlook | kPickerReloadSim);
    EXPECT_EQ(PickerActivated(state, 2, "c"), kPickerClearTicks);

    // Card ready from the start: the 1124 of the clear goes on to the SIM load.
    PickerLoadState ready;
    EXPECT_EQ(PickerActivated(ready, 2, "a"), kPickerOutlookClear);
    EXPECT_EQ(PickerOutlookDone(ready, 2), kPickerReloadOutlook | kPickerSimLoad);
    EXPECT_EQ(PickerOutlookDone(ready, 2), kPickerReloadOutlook);  // a later rebuild
}

TEST_F(ContactPickerTest, TheSignatureFollowsTheFiles) {
    const std::string none = PickerCacheSignature(caches_);
    Sim("simphonebk1.db", {{"Alice", "1"}});
    const std::string one = PickerCacheSignature(caches_);
    EXPECT_NE(one, none);
    EXPECT_EQ(PickerCacheSignature(caches_), one);
    Sim("simphonebk1.db", {{"Alice", "1"}, {"Bob", "2"}});
    EXPECT_NE(PickerCacheSignature(caches_), one);
}

}  // namespace
}  // namespace vqm
