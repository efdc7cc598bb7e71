#include "calls/event_log.h"

#include <gtest/gtest.h>
#include <unistd.h>

#include <chrono>
#include <cstring>
#include <filesystem>
#include <fstream>
#include <string>
#include <thread>
#include <vector>

#include "support/settings_store.h"
#include "tests/common/temp_folder.h"

namespace vqm {
namespace {

namespace fs = std::filesystem;
using std::chrono::system_clock;

class EventLogTest : public ::testing::Test {
  protected:
    EventRecord Record(uint8_t type, const std::string& line) {
        return MakeEventRecord(type, line.data(), line.data() + line.size(), system_clock::now());
    }

    const testing::TempFolder temp_;
    const std::string folder_ = temp_.Path();
    const std::string path_ = folder_ + "/event.log";
};

TEST_F(EventLogTest, RecordsComeOffInOrderAndLeaveNoFiles) {
    EventLog log(path_);
    EXPECT_EQ(log.EventLogCount(), 0);
    ASSERT_EQ(log.EventLogAppend(Record(kEventRing, "+CRING: VOICE")), 1);
    ASSERT_EQ(log.EventLogAppend(Record(kEventCallerId, "+CLIP: \"+447700900123\",145")), 1);
    ASSERT_EQ(log.EventLogAppend(Record(kEventNewMessage, "+CMTI: \"SM\",3")), 1);
    EXPECT_EQ(fs::file_size(path_), 3 * kEventRecordSize);
    EXPECT_EQ(log.EventLogCount(), 3);

    const char* expected[] = {"+CRING: VOICE", "+CLIP: \"+447700900123\",145", "+CMTI: \"SM\",3"};
    for (int i = 0; i < 3; ++i) {
        EventRecord record{};
        ASSERT_EQ(log.EventLogPop(&record), 1);
        EXPECT_EQ(record.type, i);
        EXPECT_STREQ(record.text, expected[i]);
        EXPECT_EQ(record.length, std::strlen(expected[i]));
        EXPECT_EQ(log.EventLogCount(), 2 - i);
    }
    EXPECT_FALSE(fs::exists(path_));
    EXPECT_FALSE(fs::exists(path_ + ".tmp"));
    EventRecord none{};
    EXPECT_EQ(log.EventLogPop(&none), 0);  // no file: nothing to take
}

TEST_F(EventLogTest, TextStopsAtTheLineEndAndAt255Bytes) {
    std::string reply = "+CLIP: \"0123\",129\r\n\r\nOK\r\n";
    EventRecord clip = Record(kEventCallerId, reply);
    EXPECT_STREQ(clip.text, "+CLIP: \"0123\",129");
    EXPECT_EQ(clip.length, 17);

    std::string longLine = "+CLIP: " + std::string(293, '7') + "\r\n";  // 300 before the CR
    EventRecord cut = Record(kEventCallerId, longLine);
    EXPECT_EQ(cut.length, 255);
    EXPECT_EQ(std::string(cut.text), longLine.substr(0, 255));

    // The reply's end bounds the text even when no line end follows.
    const char unterminated[4] = {'+', 'C', 'M', 'T'};
    EventRecord partial =
        MakeEventRecord(kEventNewMessage, unterminated, unterminated + 4, system_clock::now());
    EXPECT_STREQ(partial.text, "+CMT");
}

TEST_F(EventLogTest, BytesOnDiskAreTheRecordLayout) {
    // 2026-11-22 13:05:09.250 UTC, a Sunday.
    auto when = system_clock::from_time_t(1795352709) + std::chrono::milliseconds(250);
    const std::string line = "+CRING: VOICE";
    EventRecord record = MakeEventRecord(kEventRing, line.data(), line.data() + line.size(), when);
    EventLog log(path_);
    ASSERT_EQ(log.EventLogAppend(record), 1);

    std::ifstream file(path_, std::ios::binary);
    std::vector<unsigned char> bytes((std::istreambuf_iterator<char>(file)), {});
    ASSERT_EQ(bytes.size(), 274u);
    auto u16 = [&](int at) { return bytes[at] | (bytes[at + 1] << 8); };
    EXPECT_EQ(u16(0), 2026);
    EXPECT_EQ(u16(2), 11);
    EXPECT_EQ(u16(4), 0);  // Sunday
    EXPECT_EQ(u16(6), 22);
    EXPECT_EQ(u16(8), 13);
    EXPECT_EQ(u16(10), 5);
    EXPECT_EQ(u16(12), 9);
    EXPECT_EQ(u16(14), 250);
    EXPECT_EQ(bytes[16], kEventRing);
    EXPECT_EQ(bytes[17], 13);
    EXPECT_EQ(std::string(bytes.begin() + 18, bytes.begin() + 31), "+CRING: VOICE");
    EXPECT_EQ(bytes[31], 0);
}

TEST_F(EventLogTest, PartialAndDamagedRecordsAreSafe) {
    EventLog log(path_);
    ASSERT_EQ(log.EventLogAppend(Record(kEventRing, "+CRING: VOICE")), 1);
    {
        // Half a record at the end, as left by a crash in the middle of an append, with no
        // terminator and a length that lies.
        std::ofstream file(path_, std::ios::binary | std::ios::app);
        std::string junk(100, 'x');
        junk[17] = static_cast<char>(250);
        file << junk;
    }
    EXPECT_EQ(log.EventLogCount(), 1);
    EventRecord record{};
    ASSERT_EQ(log.EventLogPop(&record), 1);
    EXPECT_STREQ(record.text, "+CRING: VOICE");
    EXPECT_FALSE(fs::exists(path_));

    // A whole record of garbage still gives a terminated text no longer than its length.
    {
        std::ofstream file(path_, std::ios::binary);
        std::string junk(kEventRecordSize, 'y');
        junk[17] = static_cast<char>(255);
        file << junk;
    }
    ASSERT_EQ(log.EventLogPop(&record), 1);
    EXPECT_EQ(record.text[255], '\0');
    EXPECT_EQ(record.length, std::strlen(record.text));
}

// A crash in the middle of an append leaves part of a record at the end, cut at any byte. The
// whole records before it stay readable, and the next append or pop drops the torn part instead
// of letting it shift every later record.
TEST_F(EventLogTest, TornTailIsDroppedByTheNextAppendOrPop) {
    const std::vector<std::string> lines = {"+CRING: VOICE", "+CLIP: \"0123\",129",
                                            "+CMTI: \"SM\",7"};
    // Every append and pop syncs the file: thousands of them run in memory, not on the disk.
    const testing::TempFolder memory(std::filesystem::is_directory("/dev/shm") ? "/dev/shm"
                                                                                : "/tmp");
    const std::string path = memory / "event.log";
    for (size_t whole : {size_t{0}, size_t{2}}) {
        for (size_t cut = 1; cut < kEventRecordSize; ++cut) {
            SCOPED_TRACE("whole records " + std::to_string(whole) + ", cut at byte " +
                         std::to_string(cut));
            for (bool popFirst : {false, true}) {
                fs::remove(path);
                EventLog log(path);
                for (size_t i = 0; i <= whole; ++i)
                    ASSERT_EQ(log.EventLogAppend(Record(kEventNewMessage, lines[i])), 1);
                fs::resize_file(path, whole * kEventRecordSize + cut);
                ASSERT_EQ(log.EventLogCount(), static_cast<int>(whole));

                std::vector<std::string> expected(lines.begin(), lines.begin() + whole);
                std::vector<std::string> seen;
                if (popFirst && whole > 0) {
                    EventRecord first{};
                    ASSERT_EQ(log.EventLogPop(&first), 1);
                    seen.emplace_back(first.text);
                    ASSERT_EQ(fs::file_size(path), (whole - 1) * kEventRecordSize);
                }
                ASSERT_EQ(log.EventLogAppend(Record(kEventRing, "+CRING: AFTER")), 1);
                expected.emplace_back("+CRING: AFTER");
                ASSERT_EQ(fs::file_size(path),
                          (expected.size() - seen.size()) * kEventRecordSize);
                for (int n = log.EventLogCount(); n > 0; --n) {
                    EventRecord record{};
                    ASSERT_EQ(log.EventLogPop(&record), 1);
                    seen.emplace_back(record.text);
                }
                EXPECT_EQ(seen, expected);
                EXPECT_FALSE(fs::exists(path));
            }
        }
    }
}

TEST_F(EventLogTest, MissingFolderLosesTheEventQuietly) {
    EventLog log(folder_ + "/no-such-folder/event.log");
    EXPECT_EQ(log.EventLogAppend(Record(kEventRing, "+CRING: VOICE")), 0);
    EXPECT_EQ(log.EventLogCount(), 0);
    EventRecord record{};
    EXPECT_EQ(log.EventLogPop(&record), 0);
}

TEST_F(EventLogTest, PathFollowsTheInstallFolder) {
    SettingsStore store(folder_ + "/settings.db");
    SetSettingString(store, u"InstallPath", u"/opt/vqm");
    EXPECT_EQ(EventLogPath(store), "/opt/vqm/event.log");
}

// The listener and a transaction append and pop at the same time: nothing lost or doubled.
TEST_F(EventLogTest, ConcurrentAppendAndPopKeepEveryRecordOnce) {
    EventLog log(path_);
    constexpr int kRecords = 200;
    std::vector<std::string> seen;
    std::thread producer([&] {
        for (int i = 0; i < kRecords; ++i)
            ASSERT_EQ(
                log.EventLogAppend(Record(kEventNewMessage, "+CMTI: \"SM\"," + std::to_string(i))),
                1);
    });
    while (static_cast<int>(seen.size()) < kRecords) {
        int count = log.EventLogCount();
        for (int i = 0; i < count; ++i) {
            EventRecord record{};
            ASSERT_EQ(log.EventLogPop(&record), 1);
            seen.emplace_back(record.text);
        }
    }
    producer.join();
    for (int i = 0; i < kRecords; ++i)
        EXPECT_EQ(seen[i], "+CMTI: \"SM\"," + std::to_string(i));
    EXPECT_FALSE(fs::exists(path_));
}

}  // namespace
}  // namespace vqm
