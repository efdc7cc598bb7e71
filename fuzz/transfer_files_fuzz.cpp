// Feeds arbitrary bytes to the message store as the transfer file ("sm_clipbd.txt", 712-byte
// entries: two header words and a record) or the desktop companion's import file ("pcmsg.txt",
// 668-byte records); the first byte picks which. The transfer file's entries are read as a
// paste reads them; the import file is filed into the handheld folder, which is read back.
// Either way every record is shown as the SMS Folder shows it.
#include <cstdint>
#include <vector>

#include "fuzz/store_fixture.h"

namespace {

void Transfer(vqm::fuzz::StoreFixture& fixture, size_t size) {
    const int count = vqm::ClipboardCount(fixture.store);
    if (static_cast<size_t>(count) != size / vqm::kClipboardEntrySize) __builtin_trap();
    std::vector<vqm::SmsRecord> records;
    for (const vqm::ClipboardEntry& entry : vqm::ClipboardRead(fixture.store))
        records.push_back(entry.record);
    if (records.size() != static_cast<size_t>(count)) __builtin_trap();
    vqm::fuzz::ShowRecords(records);
}

void Import(vqm::fuzz::StoreFixture& fixture, size_t size) {
    const int taken = vqm::ImportPcMessages(fixture.store);
    if (taken < 0 || static_cast<size_t>(taken) > size / vqm::kPcMessageSize) __builtin_trap();
    std::vector<vqm::SmsRecord> records;
    vqm::StoreReadAll(fixture.store, vqm::kFolderLocal, &records);
    if (records.size() != static_cast<size_t>(taken)) __builtin_trap();
    for (const vqm::SmsRecord& record : records)
        if (record.length < 0 || record.length >= static_cast<int>(sizeof record.text) ||
            record.text[record.length] != '\0')
            __builtin_trap();
    vqm::fuzz::ShowRecords(records);
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
    if (size == 0) return 0;
    static vqm::fuzz::StoreFixture fixture;
    const bool transfer = data[0] % 2 == 0;
    // The import renames its file and appends to the folder; the transfer file is rewritten.
    if (!transfer) fixture.Remove({"pcmsg.txt.bak", "smsmsg2.db"});
    vqm::fuzz::StoreFixture::Write(fixture.Path(transfer ? "sm_clipbd.txt" : "pcmsg.txt"), data + 1,
                                   size - 1);
    if (transfer)
        Transfer(fixture, size - 1);
    else
        Import(fixture, size - 1);
    return 0;
}
