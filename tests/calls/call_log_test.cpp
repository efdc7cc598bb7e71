// The call log files: record layout, numbering, the size limit and its trim, deletes, clears,
// torn records and interrupted rewrites.
#include "calls/call_log.h"

#include <gtest/gtest.h>

#include <cstring>
#include <filesystem>
#include <fstream>
#include <iterator>
#include <set>

#include "support/settings_store.h"
#include "tests/common/temp_folder.h"

namespace vqm {
namespace {

namespace fs = std::filesystem;

class CallLogTest : public ::testing::Test {
  protected:
    CallLogTest() {
        const std::u16string folder(temp_.Path().begin(), temp_.Path().end());
        SetSettingString(settings_, u"InstallPath", folder.c_str());
        // A clock that moves one second per entry, so every entry has its own time.
        log_.localTime = [this] {
            std::tm t{};
            t.tm_year = 2024 - 1900;
            t.tm_mon = 2;
            t.tm_mday = 5;
            t.tm_hour = 7;
            t.tm_min = 8;
            t.tm_sec = 9 + ticks_++;
            return t;
        };
        log_.listener = [this](int n, CallLogChange change, const CallLogRecord* record) {
            events_.push_back({n, change, record ? std::string(record->number) : "-"});
        };
    }

    std::string Path(int n) const { return temp_ / ("callog" + std::to_string(n) + ".db"); }
    std::string Bytes(int n) const {
        std::ifstream in(Path(n), std::ios::binary);
        return std::string(std::istreambuf_iterator<char>(in), {});
    }
    void WriteBytes(int n, const std::string& bytes) const {
        std::ofstream(Path(n), std::ios::binary) << bytes;
    }
    static CallLogRecord Record(const char* number, int32_t sequence) {
        CallLogRecord record{};
        std::strncpy(record.number, number, sizeof record.number - 1);
        std::strcpy(record.time, "10:00:00,01/01/2024");
        record.sequence = sequence;
        return record;
    }
    void WriteRecords(int n, const std::vector<CallLogRecord>& records) const {
        WriteBytes(n, std::string(reinterpret_cast<const char*>(records.data()),
                                  records.size() * sizeof(CallLogRecord)));
    }
    std::vector<int32_t> Sequences(int n) {
        std::vector<int32_t> out;
        for (const CallLogRecord& r : ReadCallLog(log_, n))
            out.push_back(r.sequence);
        return out;
    }
    void SetLimit(int n, int32_t limit) {
        const std::u16string name = u"CallLogSize" + std::u16string(1, char16_t(u'0' + n));
        SetSettingInt(settings_, name.c_str(), &limit);
    }

    struct Event {
        int log;
        CallLogChange change;
        std::string number;
        bool operator==(const Event&) const = default;
    };

    const testing::TempFolder temp_;
    SettingsStore settings_{temp_ / "settings.db"};
    CallLog log_{settings_};
    int ticks_ = 0;
    std::vector<Event> events_;
};

TEST_F(CallLogTest, EntriesAreLaidOutByteForByteInTheirOwnFile) {
    ASSERT_EQ(AddDialedCall(log_, "+447700900123"), 1);
    ASSERT_EQ(AddAnsweredCall(log_, "No number"), 1);
    // Longer than the field: cut to 31 characters and still terminated.
    ASSERT_EQ(AddUnansweredCall(log_, "0123456789012345678901234567890123456789"), 1);

    const std::string dialed = Bytes(kCallLogDialed);
    ASSERT_EQ(dialed.size(), 64u);
    EXPECT_EQ(std::string(dialed.c_str()), "+447700900123");
    EXPECT_EQ(std::string(dialed.c_str() + 32), "07:08:09,05/03/2024");
    EXPECT_EQ(dialed.substr(60), std::string("\x01\x00\x00\x00", 4));

    const std::string answered = Bytes(kCallLogAnswered);
    ASSERT_EQ(answered.size(), 64u);
    EXPECT_EQ(answered[0], '\0');  // "No number" is kept as no number at all
    EXPECT_EQ(std::string(answered.c_str() + 32), "07:08:10,05/03/2024");

    const auto missed = ReadCallLog(log_, kCallLogUnanswered);
    ASSERT_EQ(missed.size(), 1u);
    EXPECT_EQ(std::string(missed[0].number), "0123456789012345678901234567890");

    EXPECT_EQ(events_, (std::vector<Event>{
                           {2, CallLogChange::Appended, "+447700900123"},
                           {1, CallLogChange::Appended, ""},
                           {3, CallLogChange::Appended, "0123456789012345678901234567890"}}));
    // A log number outside 1..3 writes nothing anywhere.
    EXPECT_EQ(AddCallLogEntry(log_, 4, "1"), 0);
    EXPECT_EQ(AddCallLogEntry(log_, 0, "1"), 0);
    EXPECT_FALSE(fs::exists(temp_ / "callog4.db"));
    EXPECT_FALSE(fs::exists(temp_ / "callog0.db"));
}

TEST_F(CallLogTest, TheEntryPastTheLimitReplacesTheOldestAndNumbersCountDownAgain) {
    for (int i = 1; i <= 20; ++i)
        AddDialedCall(log_, std::to_string(i).c_str());
    std::vector<int32_t> expected;
    for (int i = 1; i <= 20; ++i)
        expected.push_back(i);
    EXPECT_EQ(Sequences(2), expected);
    EXPECT_EQ(events_.back().change, CallLogChange::Appended);

    // 21st: numbered after the largest, the oldest goes, the list is reloaded.
    AddDialedCall(log_, "21");
    auto records = ReadCallLog(log_, 2);
    ASSERT_EQ(records.size(), 20u);
    EXPECT_EQ(std::string(records.front().number), "2");
    EXPECT_EQ(records.back().sequence, 21);
    EXPECT_EQ(events_.back(), (Event{2, CallLogChange::Reloaded, "-"}));

    // Smallest now 2: the next entry takes 1, then the count goes up from the largest again.
    AddDialedCall(log_, "22");
    EXPECT_EQ(ReadCallLog(log_, 2).back().sequence, 1);
    AddDialedCall(log_, "23");
    EXPECT_EQ(ReadCallLog(log_, 2).back().sequence, 22);
}

TEST_F(CallLogTest, TenThousandAppendsKeepTwentyUniqueEntriesAndNeverLoseTheNewest) {
    // Ten thousand flushed rewrites are about the rule, not the disk: kept in memory when the
    // machine offers a memory file system.
    char pattern[] = "/dev/shm/vqm-test-XXXXXX";
    const char* memory = fs::is_directory("/dev/shm") ? mkdtemp(pattern) : nullptr;
    const std::string folder = memory ? std::string(memory) + "/" : temp_.Path() + "/";
    const std::u16string wide(folder.begin(), folder.end());
    SetSettingString(settings_, u"InstallPath", wide.c_str());
    struct Cleanup {
        const char* path;
        ~Cleanup() {
            std::error_code ignored;
            if (path) fs::remove_all(path, ignored);
        }
    } cleanup{memory};

    for (int i = 1; i <= 10000; ++i) {
        const std::string number = std::to_string(i);
        ASSERT_EQ(AddUnansweredCall(log_, number.c_str()), 1);
        const auto records = ReadCallLog(log_, 3);
        ASSERT_EQ(records.size(), static_cast<size_t>(std::min(i, 20))) << i;
        ASSERT_EQ(std::string(records.back().number), number);
        // Oldest first: the twenty newest in the order they came.
        ASSERT_EQ(std::string(records.front().number), std::to_string(std::max(1, i - 19)));
        std::set<int32_t> distinct;
        for (const CallLogRecord& r : records) {
            ASSERT_GE(r.sequence, 1);
            distinct.insert(r.sequence);
        }
        ASSERT_EQ(distinct.size(), records.size()) << "duplicate sequence number at " << i;
    }
    EXPECT_EQ(fs::file_size(folder + "callog3.db"), 20u * 64u);
    EXPECT_FALSE(fs::exists(folder + "callog3.db.tmp"));
}

TEST_F(CallLogTest, TheLimitIsReadAtEveryAppendAndOnlyAnExactCountTrims) {
    SetLimit(1, 3);
    for (int i = 0; i < 5; ++i)
        AddAnsweredCall(log_, "1");
    EXPECT_EQ(ReadCallLog(log_, 1).size(), 3u);

    // Lowered below the count: nothing is dropped and the log grows.
    SetLimit(1, 2);
    AddAnsweredCall(log_, "2");
    AddAnsweredCall(log_, "3");
    EXPECT_EQ(ReadCallLog(log_, 1).size(), 5u);

    // Raised again: the log fills up to the new limit and then keeps it.
    SetLimit(1, 6);
    for (int i = 0; i < 4; ++i)
        AddAnsweredCall(log_, "4");
    EXPECT_EQ(ReadCallLog(log_, 1).size(), 6u);

    // A limit of one keeps only the newest.
    SetLimit(2, 1);
    AddDialedCall(log_, "a");
    AddDialedCall(log_, "b");
    const auto records = ReadCallLog(log_, 2);
    ASSERT_EQ(records.size(), 1u);
    EXPECT_EQ(std::string(records[0].number), "b");
}

TEST_F(CallLogTest, MissingLimitsAreWrittenBackAndKeptOnesStay) {
    SetLimit(2, 7);
    EnsureCallLogLimits(log_);
    int32_t values[3] = {};
    for (int n = 1; n <= 3; ++n) {
        const std::u16string name = u"CallLogSize" + std::u16string(1, char16_t(u'0' + n));
        ASSERT_EQ(GetSettingInt(settings_, name.c_str(), &values[n - 1]), 1);
    }
    EXPECT_EQ(values[0], 20);
    EXPECT_EQ(values[1], 7);
    EXPECT_EQ(values[2], 20);
    EXPECT_EQ(CallLogLimit(log_, 2), 7);
}

TEST_F(CallLogTest, ATornRecordAtTheEndIsIgnoredAndTheNextAppendStaysAligned) {
    WriteRecords(1, {Record("111", 1), Record("222", 2)});
    std::ofstream(Path(1), std::ios::binary | std::ios::app) << std::string(40, 'x');

    auto records = ReadCallLog(log_, 1);
    ASSERT_EQ(records.size(), 2u);
    EXPECT_EQ(std::string(records[1].number), "222");

    AddAnsweredCall(log_, "333");
    EXPECT_EQ(Bytes(1).size(), 3u * 64u);
    records = ReadCallLog(log_, 1);
    ASSERT_EQ(records.size(), 3u);
    EXPECT_EQ(std::string(records[2].number), "333");
    EXPECT_EQ(records[2].sequence, 3);

    // Unterminated texts from a damaged file are cut inside their fields.
    WriteBytes(2, std::string(64, 'A'));
    records = ReadCallLog(log_, 2);
    ASSERT_EQ(records.size(), 1u);
    EXPECT_EQ(std::strlen(records[0].number), 31u);
    EXPECT_EQ(std::strlen(records[0].time), 27u);
}

TEST_F(CallLogTest, DeleteRemovesEveryRecordWithTheNumberAndTheLastOneTakesTheFile) {
    WriteRecords(3, {Record("a", 4), Record("b", 7), Record("c", 4), Record("d", 9)});

    // Refused: no such entries, or numbers that identify none.
    const std::string before = Bytes(3);
    EXPECT_EQ(DeleteCallLogEntry(log_, 3, 0), 0);
    EXPECT_EQ(DeleteCallLogEntry(log_, 3, -4), 0);
    EXPECT_EQ(DeleteCallLogEntry(log_, 5, 4), 0);
    EXPECT_EQ(Bytes(3), before);

    EXPECT_EQ(DeleteCallLogEntry(log_, 3, 4), 1);
    auto records = ReadCallLog(log_, 3);
    ASSERT_EQ(records.size(), 2u);
    EXPECT_EQ(std::string(records[0].number), "b");
    EXPECT_EQ(std::string(records[1].number), "d");
    // An unknown number leaves the entries alone.
    DeleteCallLogEntry(log_, 3, 123);
    EXPECT_EQ(ReadCallLog(log_, 3).size(), 2u);

    DeleteCallLogEntry(log_, 3, 7);
    DeleteCallLogEntry(log_, 3, 9);
    EXPECT_FALSE(fs::exists(Path(3)));
    EXPECT_FALSE(fs::exists(Path(3) + ".tmp"));
    // A missing log stays missing.
    EXPECT_EQ(DeleteCallLogEntry(log_, 3, 9), 0);
    EXPECT_FALSE(fs::exists(Path(3)));

    // Sequence numbering starts over once the log is gone.
    AddUnansweredCall(log_, "e");
    EXPECT_EQ(Sequences(3), std::vector<int32_t>{1});
}

TEST_F(CallLogTest, ClearingRemovesTheFilesAndTellsTheListInOrder) {
    for (int n = 1; n <= 3; ++n)
        AddCallLogEntry(log_, n, "5");
    events_.clear();
    ClearCallLog(log_, 2);
    EXPECT_FALSE(fs::exists(Path(2)));
    EXPECT_TRUE(fs::exists(Path(1)));
    ClearCallLog(log_, 7);  // ignored
    EXPECT_EQ(events_, (std::vector<Event>{{2, CallLogChange::Cleared, "-"}}));

    events_.clear();
    ClearAllCallLogs(log_);
    for (int n = 1; n <= 3; ++n)
        EXPECT_FALSE(fs::exists(Path(n)));
    EXPECT_EQ(events_, (std::vector<Event>{{1, CallLogChange::Cleared, "-"},
                                           {2, CallLogChange::Cleared, "-"},
                                           {3, CallLogChange::Cleared, "-"}}));
}

TEST_F(CallLogTest, AnInterruptedRewriteLeavesTheOldLogWhole) {
    WriteRecords(2, {Record("a", 1), Record("b", 2), Record("c", 3)});
    const std::string before = Bytes(2);

    // A copy left half-written by an earlier crash is simply overwritten.
    std::ofstream(Path(2) + ".tmp", std::ios::binary) << std::string(100, 'z');
    ASSERT_EQ(DeleteCallLogEntry(log_, 2, 2), 1);
    EXPECT_EQ(Sequences(2), (std::vector<int32_t>{1, 3}));
    EXPECT_FALSE(fs::exists(Path(2) + ".tmp"));

    // The copy cannot be made (its name is taken by a folder): the log is left as it was.
    WriteBytes(2, before);
    fs::create_directory(Path(2) + ".tmp");
    EXPECT_EQ(DeleteCallLogEntry(log_, 2, 2), 0);
    EXPECT_EQ(Bytes(2), before);
}

TEST_F(CallLogTest, ALogThatCannotBeOpenedLosesTheEntrySilently) {
    fs::create_directory(Path(1));  // the file's name is a folder
    events_.clear();
    EXPECT_EQ(AddAnsweredCall(log_, "1"), 0);
    EXPECT_TRUE(events_.empty());
    EXPECT_TRUE(ReadCallLog(log_, 1).empty());
}

}  // namespace
}  // namespace vqm
