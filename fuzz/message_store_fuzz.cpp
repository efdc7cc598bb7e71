// Feeds arbitrary bytes to the message store as a folder file ("smsmsg2.db"): 704-byte records,
// maybe a torn one at the end. The store reads them as the SMS Folder lists them and each is
// shown; the store then appends a record, which must first drop the torn tail so that the new
// record lands on the 704-byte grid, with nothing else lost.
#include <cstdint>
#include <cstring>
#include <vector>

#include "fuzz/store_fixture.h"

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
    static vqm::fuzz::StoreFixture fixture;
    using vqm::kFolderLocal, vqm::kSmsRecordSize;
    // Written afresh each time, so the append below always starts from the input alone.
    const std::string path = fixture.Path("smsmsg2.db");
    vqm::fuzz::StoreFixture::Write(path, data, size);
    const size_t whole = size / kSmsRecordSize;

    std::vector<vqm::SmsRecord> records;
    if (!vqm::StoreReadAll(fixture.store, kFolderLocal, &records) || records.size() != whole)
        __builtin_trap();
    vqm::fuzz::ShowRecords(records);

    vqm::SmsRecord added{};
    added.index = 1;
    std::strcpy(added.status, "PDA PDA");
    std::strcpy(added.text, "appended");
    added.length = 8;
    if (!vqm::StoreAppend(fixture.store, kFolderLocal, added)) __builtin_trap();
    // Whole records only, and those before the new one are the ones read, byte for byte.
    FILE* file = std::fopen(path.c_str(), "rb");
    if (!file) __builtin_trap();
    std::vector<uint8_t> after((whole + 1) * kSmsRecordSize + 1);
    if (std::fread(after.data(), 1, after.size(), file) != after.size() - 1) __builtin_trap();
    std::fclose(file);
    if (std::memcmp(after.data(), data, whole * kSmsRecordSize) != 0 ||
        std::memcmp(after.data() + whole * kSmsRecordSize, &added, sizeof added) != 0)
        __builtin_trap();
    return 0;
}
