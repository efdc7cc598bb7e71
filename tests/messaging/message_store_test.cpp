// The message store: its folder files byte for byte, the guard, the index lists, the transfer
// and import files, and the SIM refresh, intake and new-message note against the simulated card.
#include "messaging/message_store.h"

#include <gtest/gtest.h>

#include <atomic>
#include <chrono>
#include <cstring>
#include <filesystem>
#include <fstream>
#include <memory>
#include <string>
#include <thread>
#include <vector>

#include "cardsim/card_sim.h"
#include "link/link.h"
#include "messaging/sms_folder.h"
#include "support/settings_store.h"
#include "support/text.h"
#include "tests/common/temp_folder.h"

namespace vqm {
namespace {

namespace fs = std::filesystem;

SmsRecord Record(int index, const char* status, const char* text = "Hello") {
    SmsRecord record{};
    record.index = index;
    std::snprintf(record.status, sizeof record.status, "%s", status);
    std::snprintf(record.number, sizeof record.number, "+447700900123");
    std::snprintf(record.text, sizeof record.text, "%s", text);
    record.length = static_cast<int32_t>(std::strlen(text));
    return record;
}

std::string FileBytes(const std::string& path) {
    std::ifstream in(path, std::ios::binary);
    return std::string(std::istreambuf_iterator<char>(in), {});
}

void WriteBytes(const std::string& path, const std::string& bytes) {
    std::ofstream(path, std::ios::binary | std::ios::trunc) << bytes;
}

class MessageStoreTest : public ::testing::Test {
  protected:
    MessageStoreTest() {
        SetSettingString(settings_, u"InstallPath", Utf8ToUtf16(temp_.Path() + "/").c_str());
        StoreGuardCreate(store_);
    }

    std::string Folder(int folder) { return StoreFolderPath(store_, folder); }

    std::vector<SmsRecord> All(int folder) {
        std::vector<SmsRecord> records;
        EXPECT_TRUE(StoreReadAll(store_, folder, &records));
        return records;
    }

    std::string List(const char16_t* name) {
        char16_t value[kMaxSettingLength + 1] = {};
        if (!GetSettingString(settings_, name, value, kMaxSettingLength + 1)) return "<absent>";
        return Utf16ToUtf8(value);
    }

    const testing::TempFolder temp_;
    SettingsStore settings_{temp_ / "settings.db"};
    MessageStore store_{settings_};
};

TEST_F(MessageStoreTest, FolderPathsAndRecordBytes) {
    EXPECT_EQ(Folder(kFolderSim), temp_ / "smsmsg1.db");
    EXPECT_EQ(Folder(kFolderLocal), temp_ / "smsmsg2.db");
    EXPECT_EQ(Folder(3), "");
    EXPECT_EQ(StoreExists(store_), 0);

    SmsRecord record = Record(0x01020304, "REC READ", "Hi");
    record.coding = 8;
    ASSERT_EQ(StoreAppend(store_, kFolderLocal, record), 1);
    EXPECT_EQ(StoreExists(store_), 1);
    const std::string bytes = FileBytes(Folder(kFolderLocal));
    ASSERT_EQ(bytes.size(), 704u);
    EXPECT_EQ(bytes.substr(0, 12), std::string("\x04\x03\x02\x01\x08\0\0\0\x02\0\0\0", 12));
    EXPECT_EQ(bytes.substr(12, 14), std::string("+447700900123\0", 14));
    EXPECT_EQ(bytes.substr(32, 9), std::string("REC READ\0", 9));
    EXPECT_EQ(bytes.substr(64, 3), std::string("Hi\0", 3));

    SmsRecord back{};
    EXPECT_EQ(StoreReadAt(store_, kFolderLocal, 0, &back), 1);
    EXPECT_EQ(std::memcmp(&back, &record, sizeof record), 0);
    EXPECT_EQ(StoreReadAt(store_, kFolderLocal, 704, &back), 0);  // past the end
    EXPECT_EQ(StoreReadAt(store_, kFolderLocal, -1, &back), 0);
    EXPECT_EQ(StoreReadAt(store_, 3, 0, &back), 0);
    EXPECT_EQ(StoreAppend(store_, 0, record), 0);
}

TEST_F(MessageStoreTest, ReadAtWantsABodyOfOneTo639) {
    for (int length : {0, 1, 639, 640, -1}) {
        SmsRecord record = Record(1, "PDA PDA");
        record.length = length;
        std::remove(Folder(kFolderLocal).c_str());
        ASSERT_EQ(StoreAppend(store_, kFolderLocal, record), 1);
        SmsRecord back{};
        EXPECT_EQ(StoreReadAt(store_, kFolderLocal, 0, &back), length >= 1 && length <= 639)
            << length;
    }
}

TEST_F(MessageStoreTest, NextIndexFillsBelowTheLowestBeforeGrowing) {
    struct Case {
        std::vector<int> indices;
        int next;
    };
    const Case cases[] = {{{}, 1},  {{1, 2, 3}, 4}, {{5, 9}, 4},
                          {{2}, 1}, {{1, 7}, 8},    {{9, 1}, 10}};
    for (const Case& c : cases) {
        std::remove(Folder(kFolderLocal).c_str());
        for (int index : c.indices)
            ASSERT_EQ(StoreAppend(store_, kFolderLocal, Record(index, "PDA PDA")), 1);
        EXPECT_EQ(StoreNextIndex(store_, kFolderLocal), c.next)
            << ::testing::PrintToString(c.indices);
    }
}

TEST_F(MessageStoreTest, DeleteAndSetStatusTouchEveryMatchingRecord) {
    for (int index : {3, 5, 3, 7})
        ASSERT_EQ(StoreAppend(store_, kFolderSim, Record(index, "REC UNREAD")), 1);

    ASSERT_EQ(StoreSetStatus(store_, kFolderSim, 3, "REC READ"), 1);
    std::vector<SmsRecord> records = All(kFolderSim);
    ASSERT_EQ(records.size(), 4u);
    for (const SmsRecord& r : records)
        EXPECT_STREQ(r.status, r.index == 3 ? "REC READ" : "REC UNREAD") << r.index;

    ASSERT_EQ(StoreDelete(store_, kFolderSim, 3), 1);
    records = All(kFolderSim);
    ASSERT_EQ(records.size(), 2u);
    EXPECT_EQ(records[0].index, 5);
    EXPECT_EQ(records[1].index, 7);
    EXPECT_FALSE(fs::exists(Folder(kFolderSim) + ".tmp"));

    // An index nowhere in the file still rewrites it, unchanged.
    EXPECT_EQ(StoreDelete(store_, kFolderSim, 42), 1);
    EXPECT_EQ(All(kFolderSim).size(), 2u);

    ASSERT_EQ(StoreDelete(store_, kFolderSim, 5), 1);
    ASSERT_EQ(StoreDelete(store_, kFolderSim, 7), 1);
    EXPECT_FALSE(fs::exists(Folder(kFolderSim)));  // the last record takes the file with it

    // No file, a bad index or a bad folder: nothing to rewrite.
    EXPECT_EQ(StoreDelete(store_, kFolderSim, 5), 0);
    EXPECT_FALSE(fs::exists(Folder(kFolderSim) + ".tmp"));
    EXPECT_EQ(StoreDelete(store_, kFolderLocal, 0), 0);
    EXPECT_EQ(StoreSetStatus(store_, 3, 1, "REC READ"), 0);
}

TEST_F(MessageStoreTest, TornTrailingRecordIsIgnoredAndDroppedByTheNextWrite) {
    std::string bytes;
    for (int index : {1, 2}) {
        SmsRecord record = Record(index, "PDA PDA");
        bytes.append(reinterpret_cast<const char*>(&record), sizeof record);
    }
    bytes.append(300, 'x');  // a record cut short by a crash
    WriteBytes(Folder(kFolderLocal), bytes);

    EXPECT_EQ(All(kFolderLocal).size(), 2u);
    EXPECT_EQ(StoreNextIndex(store_, kFolderLocal), 3);

    // The append starts on the record grid again, not behind the torn bytes.
    ASSERT_EQ(StoreAppend(store_, kFolderLocal, Record(3, "PDA PDA")), 1);
    EXPECT_EQ(fs::file_size(Folder(kFolderLocal)), 3 * 704u);

    bytes = FileBytes(Folder(kFolderLocal));
    WriteBytes(Folder(kFolderLocal), bytes + std::string(100, 'y'));
    ASSERT_EQ(StoreSetStatus(store_, kFolderLocal, 2, "STO SENT"), 1);
    EXPECT_EQ(fs::file_size(Folder(kFolderLocal)), 3 * 704u);
    EXPECT_STREQ(All(kFolderLocal)[1].status, "STO SENT");
}

TEST_F(MessageStoreTest, GuardGrantsReadersTogetherAndWritersAlone) {
    ASSERT_EQ(StoreAppend(store_, kFolderSim, Record(1, "REC READ")), 1);

    ASSERT_EQ(StoreGuardAcquire(store_, kAccessRead), 1);
    EXPECT_EQ(StoreGuardAcquire(store_, kAccessRead), 1);
    EXPECT_EQ(StoreGuardAcquire(store_, kAccessWrite), 0);
    StoreGuardRelease(store_);

    ASSERT_EQ(StoreGuardAcquire(store_, kAccessWrite), 1);
    EXPECT_EQ(StoreGuardAcquire(store_, kAccessRead), 0);
    // A rewrite that cannot claim the store fails and leaves the file as it was.
    const std::string before = FileBytes(Folder(kFolderSim));
    EXPECT_EQ(StoreDelete(store_, kFolderSim, 1), 0);
    EXPECT_EQ(StoreAppend(store_, kFolderSim, Record(2, "REC READ")), 0);
    std::vector<SmsRecord> records;
    EXPECT_FALSE(StoreReadAll(store_, kFolderSim, &records));
    EXPECT_EQ(FileBytes(Folder(kFolderSim)), before);
    StoreGuardRelease(store_);

    EXPECT_EQ(StoreDelete(store_, kFolderSim, 1), 1);
    StoreGuardDestroy(store_);
    EXPECT_EQ(store_.access, kAccessFree);
}

TEST_F(MessageStoreTest, GuardWaitIsBoundedWhenTheMutexIsHeld) {
    std::lock_guard<std::mutex> held(store_.guardMutex);
    const auto start = std::chrono::steady_clock::now();
    EXPECT_EQ(StoreGuardAcquire(store_, kAccessRead), 0);
    const auto waited = std::chrono::steady_clock::now() - start;
    EXPECT_GE(waited, std::chrono::milliseconds(450));
    EXPECT_LT(waited, std::chrono::milliseconds(3000));
}

TEST_F(MessageStoreTest, IndexListsKeepTheirQuotedForm) {
    EXPECT_EQ(IndexListCount(settings_, kNewIdx), 0);
    EXPECT_EQ(IndexListContains(settings_, kNewIdx, 3), 0);
    EXPECT_EQ(IndexListRemove(settings_, kNewIdx, 3), 1);
    EXPECT_EQ(List(kNewIdx), "<absent>");  // nothing written for an absent list

    EXPECT_EQ(IndexListAdd(settings_, kNewIdx, 3), 1);
    EXPECT_EQ(List(kNewIdx), "\"3\"");
    EXPECT_EQ(IndexListAdd(settings_, kNewIdx, 3), 1);
    EXPECT_EQ(IndexListAdd(settings_, kNewIdx, 12), 1);
    EXPECT_EQ(IndexListAdd(settings_, kNewIdx, 255), 1);
    EXPECT_EQ(List(kNewIdx), "\"3\"\"12\"\"255\"");
    EXPECT_EQ(IndexListCount(settings_, kNewIdx), 3);
    EXPECT_EQ(IndexListContains(settings_, kNewIdx, 12), 1);
    EXPECT_EQ(IndexListContains(settings_, kNewIdx, 1), 0);  // "12" is not "1"
    EXPECT_EQ(IndexListAdd(settings_, kNewIdx, 0), 0);
    EXPECT_EQ(IndexListContains(settings_, kNewIdx, 0), 0);

    EXPECT_EQ(IndexListRemove(settings_, kNewIdx, 12), 1);
    EXPECT_EQ(List(kNewIdx), "\"3\"\"255\"");
    EXPECT_EQ(IndexListRemove(settings_, kNewIdx, 4), 1);
    EXPECT_EQ(List(kNewIdx), "\"3\"\"255\"");
    EXPECT_EQ(IndexListRemove(settings_, kNewIdx, 3), 1);
    EXPECT_EQ(IndexListRemove(settings_, kNewIdx, 255), 1);
    EXPECT_EQ(List(kNewIdx), "");
    EXPECT_EQ(IndexListCount(settings_, kNewIdx), 0);

    // A list with no room left refuses a location rather than keep part of it.
    std::u16string full;
    for (int location = 100; full.size() + 5 <= kMaxSettingLength; ++location)
        full += u"\"" + Utf8ToUtf16(std::to_string(location)) + u"\"";
    ASSERT_EQ(SetSettingString(settings_, kNewIdx, full.c_str()), 1);
    const int count = IndexListCount(settings_, kNewIdx);
    EXPECT_EQ(IndexListAdd(settings_, kNewIdx, 999), 0);
    EXPECT_EQ(IndexListCount(settings_, kNewIdx), count);
    EXPECT_EQ(IndexListAdd(settings_, kNewIdx, 100), 1);  // already there
    ASSERT_EQ(IndexListRemove(settings_, kNewIdx, 100), 1);
    EXPECT_EQ(IndexListAdd(settings_, kNewIdx, 999), 1);
    EXPECT_EQ(IndexListContains(settings_, kNewIdx, 999), 1);
    SetSettingString(settings_, kNewIdx, u"");

    // The unread count takes a location in both lists once.
    IndexListAdd(settings_, kNewIdx, 5);
    IndexListAdd(settings_, kUnreadIdx, 5);
    IndexListAdd(settings_, kUnreadIdx, 6);
    EXPECT_EQ(UnreadMessageCount(settings_), 2);
}

TEST_F(MessageStoreTest, DamagedIndexListsAreReadAsFarAsTheyAreSound) {
    struct Case {
        const char16_t* value;
        int count;
        int present;  // a location the walk finds
        int absent;   // one it must not find
    };
    const Case cases[] = {
        {u"\"3\"\"12", 1, 3, 12},   // the last quote missing
        {u"\"ab\"\"4\"", 2, 4, 0},  // letters read as 0, the walk goes on
        {u"\"", 0, -1, 1},          // a lone quote
        {u"x7\"8\"", 1, 8, 7},      // text outside quotes is passed over
        {u"\"99999999999\"\"2\"", 2, 2, 1},
        {u"", 0, -1, 1},
    };
    for (const Case& c : cases) {
        ASSERT_EQ(SetSettingString(settings_, kNewIdx, c.value), 1);
        EXPECT_EQ(IndexListCount(settings_, kNewIdx), c.count) << Utf16ToUtf8(c.value);
        if (c.present > 0) {
            EXPECT_EQ(IndexListContains(settings_, kNewIdx, c.present), 1);
        }
        if (c.absent > 0) {
            EXPECT_EQ(IndexListContains(settings_, kNewIdx, c.absent), 0);
        }
        // A location added after the damage is found: what cannot be read goes.
        EXPECT_EQ(IndexListAdd(settings_, kNewIdx, 40), 1);
        EXPECT_EQ(IndexListContains(settings_, kNewIdx, 40), 1) << Utf16ToUtf8(c.value);
        EXPECT_EQ(IndexListCount(settings_, kNewIdx), c.count + 1) << Utf16ToUtf8(c.value);
        EXPECT_EQ(IndexListRemove(settings_, kNewIdx, 40), 1);
        EXPECT_EQ(IndexListContains(settings_, kNewIdx, 40), 0) << Utf16ToUtf8(c.value);
    }
}

TEST_F(MessageStoreTest, TransferFileEntriesAndWhereTheyArePasted) {
    std::vector<int> pasted;
    store_.hooks.pasteInto = [&](int page) { pasted.push_back(page); };
    EXPECT_EQ(ClipboardCount(store_), 0);

    const SmsRecord sent = Record(4, "STO SENT", "Out it goes");
    ASSERT_EQ(ClipboardCopyRecord(store_, sent), 1);
    ASSERT_EQ(ClipboardCopyText(store_, u"Plain draft", 11), 1);
    const std::u16string greek = u"Καλημέρα";
    ASSERT_EQ(ClipboardCopyText(store_, greek.data(), greek.size()), 1);
    EXPECT_EQ(ClipboardCopyText(store_, u"", 0), 0);
    EXPECT_EQ(pasted, (std::vector<int>{kPageSent, kPageDraft, kPageDraft}));

    const std::string bytes = FileBytes(ClipboardPath(store_));
    ASSERT_EQ(bytes.size(), 3 * 712u);
    EXPECT_EQ(bytes.substr(0, 8), std::string(8, '\0'));
    EXPECT_EQ(std::memcmp(bytes.data() + 8, &sent, sizeof sent), 0);
    EXPECT_EQ(ClipboardCount(store_), 3);

    const std::vector<ClipboardEntry> entries = ClipboardRead(store_);
    ASSERT_EQ(entries.size(), 3u);
    EXPECT_EQ(entries[1].record.coding, 0);
    EXPECT_EQ(entries[1].record.length, 11);
    EXPECT_STREQ(entries[1].record.text, "Plain draft");
    EXPECT_EQ(entries[2].record.coding, 8);
    EXPECT_EQ(entries[2].record.length, 32);
    EXPECT_EQ(std::string(entries[2].record.text, 8), "039A03B1");

    ClipboardRemove(store_);
    EXPECT_EQ(ClipboardCount(store_), 0);
}

// A kill in the middle of an append's write can leave the start of an entry behind (the crash
// soak saw it stop at a page boundary); the next entry must start on the 712-byte grid again.
TEST_F(MessageStoreTest, TransferEntryCutShortIsIgnoredAndDroppedByTheNextAppend) {
    for (size_t cut : {size_t{1}, kClipboardHeaderSize, size_t{300}, kClipboardEntrySize - 1}) {
        SCOPED_TRACE("cut after " + std::to_string(cut) + " bytes");
        ClipboardRemove(store_);
        ASSERT_EQ(ClipboardAppend(store_, Record(1, "REC READ", "first")), 1);
        ASSERT_EQ(ClipboardAppend(store_, Record(2, "REC READ", "second")), 1);
        const std::string whole = FileBytes(ClipboardPath(store_));
        WriteBytes(ClipboardPath(store_), whole + whole.substr(0, cut));
        EXPECT_EQ(ClipboardCount(store_), 2);
        EXPECT_EQ(ClipboardRead(store_).size(), 2u);

        ASSERT_EQ(ClipboardAppend(store_, Record(3, "REC READ", "third")), 1);
        EXPECT_EQ(fs::file_size(ClipboardPath(store_)), 3 * kClipboardEntrySize);
        const std::vector<ClipboardEntry> entries = ClipboardRead(store_);
        ASSERT_EQ(entries.size(), 3u);
        EXPECT_EQ(entries[2].cut, 0);
        EXPECT_EQ(entries[2].record.index, 3);
        EXPECT_STREQ(entries[2].record.text, "third");
    }
}

TEST_F(MessageStoreTest, ImportTakesThePcFileInOnceAndRenamesIt) {
    auto pc = [](const char* folder, const char* number, const char* date, const char* text) {
        PcMessage m{};
        std::snprintf(m.folder, sizeof m.folder, "%s", folder);
        std::snprintf(m.number, sizeof m.number, "%s", number);
        std::memcpy(m.date, date, std::min(std::strlen(date), sizeof m.date));
        std::snprintf(m.text, sizeof m.text, "%s", text);
        return std::string(reinterpret_cast<const char*>(&m), sizeof m);
    };
    ASSERT_EQ(StoreAppend(store_, kFolderLocal, Record(5, "PDA PDA")), 1);
    WriteBytes(PcMessagesPath(store_),
               pc("DRAFT", "+301234", "02/03/11,14:25:36", "Draft text") +
                   pc("PDA", "+302222", "02/03/11,14:25:36", "Kept") +
                   pc("INBOX", "+303333", "02/03/11,14:25:36", "Skipped") +
                   pc("STO SENT", "6977", "99/12/31,23:59:58", "Gr\xfc\xdf Gott \xbd") +
                   std::string(100, 'z'));  // a torn record at the end

    EXPECT_EQ(ImportPcMessages(store_), 3);
    EXPECT_FALSE(fs::exists(PcMessagesPath(store_)));
    EXPECT_TRUE(fs::exists(PcMessagesPath(store_) + ".bak"));

    const std::vector<SmsRecord> records = All(kFolderLocal);
    ASSERT_EQ(records.size(), 4u);
    EXPECT_EQ(records[1].index, 4);
    EXPECT_STREQ(records[1].status, "PDA DRAFT");
    EXPECT_STREQ(records[1].number, "");
    EXPECT_STREQ(records[1].date, "");
    EXPECT_STREQ(records[1].text, "Draft text");
    EXPECT_EQ(records[2].index, 3);
    EXPECT_STREQ(records[2].status, "PDA PDA");
    EXPECT_STREQ(records[2].number, "+302222");
    EXPECT_STREQ(records[2].date, "14:25:36,11/03/2002");
    EXPECT_EQ(records[3].index, 2);
    EXPECT_STREQ(records[3].status, "STO SENT");
    EXPECT_STREQ(records[3].date, "23:59:58,31/12/2099");
    // The one-half sign has no GSM code: the whole body goes as UCS2.
    EXPECT_EQ(records[3].coding, 8);
    EXPECT_EQ(std::string(records[3].text, 12),
              "004700720"
              "0FC");

    // An older backup is never replaced: the file stays and comes in again next time.
    WriteBytes(PcMessagesPath(store_), pc("PDA", "1", "02/03/11,14:25:36", "Again"));
    EXPECT_EQ(ImportPcMessages(store_), 1);
    EXPECT_TRUE(fs::exists(PcMessagesPath(store_)));
    EXPECT_EQ(ImportPcMessages(store_), 1);
    EXPECT_EQ(All(kFolderLocal).size(), 6u);
}

// The store against the simulated card over a pseudo-terminal.
class MessageStoreCardTest : public MessageStoreTest {
  protected:
    MessageStoreCardTest() {
        cardsim::SimConfig config;
        config.baud = 0;
        config.runtimeDir = temp_ / "run";
        config.stateFile = temp_ / "card.state";  // the demo SIM: four messages
        sim_ = std::make_unique<cardsim::CardSim>(config);
        if (sim_->PowerUp()) opened_ = PortOpenDevice(link_, sim_->DevicePath().c_str());
    }
    ~MessageStoreCardTest() override {
        StoreJoinRefresh(store_);
        PortClose(link_);
    }
    void SetUp() override { ASSERT_EQ(opened_, 1); }

    // Starts the refresh and waits (bounded) for its end notice.
    bool Refresh() {
        std::atomic<bool> done{false};
        StoreStartSimRefresh(store_, link_, [&] { done = true; });
        for (int i = 0; i < 1000 && !done; ++i)
            std::this_thread::sleep_for(std::chrono::milliseconds(10));
        StoreJoinRefresh(store_);
        return done;
    }

    Link link_{settings_, DriverRoots{temp_ / "run", temp_ / "tty"}};
    std::unique_ptr<cardsim::CardSim> sim_;
    int opened_ = 0;
};

TEST_F(MessageStoreCardTest, RefreshReadsTheSimIntoTheCacheAndAlwaysReportsBack) {
    // A stale cache goes first.
    ASSERT_EQ(StoreAppend(store_, kFolderSim, Record(17, "REC READ")), 1);
    ASSERT_TRUE(Refresh());
    std::vector<SmsRecord> records = All(kFolderSim);
    ASSERT_EQ(records.size(), 4u);
    EXPECT_EQ(records[0].index, 1);
    EXPECT_STREQ(records[1].status, "REC UNREAD");
    EXPECT_STREQ(records[1].number, "+447700900123");
    EXPECT_STREQ(records[3].status, "STO UNSENT");
    EXPECT_EQ(store_.access, kAccessFree);

    // An empty SIM reads no location and still reports back.
    for (int location = 1; location <= 4; ++location)
        ASSERT_EQ(SmsDelete(link_, location), 0);
    ASSERT_TRUE(Refresh());
    EXPECT_TRUE(All(kFolderSim).empty());

    // A pulled card: the refresh ends, reports back and leaves the store free.
    PortClose(link_);
    ASSERT_TRUE(Refresh());
    EXPECT_EQ(store_.access, kAccessFree);
}

TEST_F(MessageStoreCardTest, NewMessageIsNotedThenTakenInThroughTheTransferFile) {
    std::vector<std::string> calls;
    store_.hooks.simFullAlert = [&](int full) { calls.push_back("full" + std::to_string(full)); };
    store_.hooks.beginBusy = [&] { calls.push_back("busy"); };
    store_.hooks.endBusy = [&] { calls.push_back("idle"); };
    store_.hooks.pasteInto = [&](int page) {
        calls.push_back("paste" + std::to_string(page) + ":" +
                        std::to_string(ClipboardCount(store_)));
    };
    store_.hooks.selectFirstUnread = [&] { calls.push_back("select"); };
    // A "+CMTI:" as the DialPad takes it: the card asked whether the SIM is full, then noted.
    auto NoteNew = [&](int location) {
        return SmsNoteNewMessage(settings_, SmsStorageFull(link_), location,
                                 store_.hooks.simFullAlert);
    };

    EXPECT_EQ(SmsIntakeNew(store_, link_), 0);  // nothing announced
    EXPECT_TRUE(calls.empty());

    ASSERT_EQ(sim_->Control("deliver +447700900999 Hello there"), "OK");
    ASSERT_EQ(NoteNew(5), 1);
    EXPECT_TRUE(calls.empty());  // the SIM has room
    EXPECT_EQ(IndexListContains(settings_, kNewIdx, 5), 1);

    ASSERT_EQ(SmsIntakeNew(store_, link_), 1);
    EXPECT_EQ(calls, (std::vector<std::string>{"busy", "idle", "paste0:1", "select"}));
    const std::vector<ClipboardEntry> entries = ClipboardRead(store_);
    ASSERT_EQ(entries.size(), 1u);
    EXPECT_STREQ(entries[0].record.text, "Hello there");
    EXPECT_STREQ(entries[0].record.status, "REC UNREAD");
    EXPECT_EQ(IndexListContains(settings_, kNewIdx, 5), 1);  // the view takes it out

    // A full SIM raises its alert before the location is queued.
    ASSERT_EQ(sim_->Control("capacity 5"), "OK");
    calls.clear();
    ASSERT_EQ(NoteNew(5), 1);
    EXPECT_EQ(calls, std::vector<std::string>{"full1"});

    // A location the SIM cannot read stops the intake with the busy look taken off.
    ClipboardRemove(store_);
    IndexListAdd(settings_, kNewIdx, 9);
    calls.clear();
    EXPECT_EQ(SmsIntakeNew(store_, link_), 0);
    EXPECT_EQ(calls, (std::vector<std::string>{"busy", "idle"}));
}

TEST_F(MessageStoreCardTest, ConcatenatedPartsListAsOneMessageAndGoTogether) {
    // 3 parts of 153 septets; a named sender; a part that never came (deleted on the SIM).
    std::string text;
    for (int i = 0; text.size() < 400; ++i)
        text += "word" + std::to_string(i) + " ";
    ASSERT_EQ(sim_->Control("deliver +447700900777 " + text), "OK");
    ASSERT_EQ(sim_->Control("deliver MyBank Your code is 1234"), "OK");
    ASSERT_EQ(sim_->Control("deliver +447700900888 " + text), "OK");
    ASSERT_EQ(SmsDelete(link_, 10), 0);  // the second message's middle part
    ASSERT_TRUE(Refresh());

    FolderListing listing;
    ASSERT_TRUE(FillFolderPages(store_, {}, {}, &listing));
    const std::vector<FolderRow>& inbox = listing.pages[kPageInbox];
    ASSERT_EQ(inbox.size(), 3u + 3u);  // the demo's three, the two long ones and the bank's
    const FolderRow* whole = nullptr;
    const FolderRow* gap = nullptr;
    const FolderRow* bank = nullptr;
    for (const FolderRow& row : inbox) {
        if (row.from == u"+447700900777") whole = &row;
        if (row.from == u"+447700900888") gap = &row;
        if (row.from == u"MyBank") bank = &row;
    }
    ASSERT_TRUE(whole && gap && bank);
    EXPECT_EQ(Utf16ToUtf8(whole->body), text.substr(0, text.find_last_not_of(' ') + 1) + " ");
    EXPECT_EQ(whole->parts, (std::vector<int>{5, 6, 7}));
    EXPECT_EQ(Utf16ToUtf8(gap->body),
              text.substr(0, 153) + "(part 2 of 3 missing)" + text.substr(306));
    EXPECT_EQ(bank->body, u"Your code is 1234");
    EXPECT_EQ(listing.unread[kPageInbox], 1 + 3);

    // Deleting the message deletes every part, on the SIM and in the cache.
    FolderUi ui;
    std::vector<std::u16string> boxes;
    ui.box = [&](const std::u16string& t, const std::u16string&) { boxes.push_back(t); };
    ASSERT_EQ(DeleteMessages(store_, link_, {*whole}, ui, {}), 1);
    EXPECT_TRUE(boxes.empty());
    for (int location : {5, 6, 7}) {
        SmsRecord gone{};
        gone.index = location;
        EXPECT_EQ(SmsRead(link_, kSmsModePdu, &gone), 0) << location;
    }
    ASSERT_TRUE(FillFolderPages(store_, {}, {}, &listing));
    EXPECT_EQ(listing.pages[kPageInbox].size(), 5u);
}

}  // namespace
}  // namespace vqm
