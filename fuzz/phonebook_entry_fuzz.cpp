// Feeds arbitrary card replies to the phonebook parsers: one entry line, a run of entries into
// ten slots, the usage and geometry lines. The input is copied into a buffer of exactly its size
// so any read past the reply is caught by the address sanitizer.
#include <cstdint>
#include <cstring>
#include <vector>

#include "contacts/phonebook_at.h"

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
    if (size > 1 << 16) return 0;
    std::vector<char> reply(data, data + size);
    const char* begin = reply.data();
    const int length = static_cast<int>(size);

    vqm::PhonebookEntry entry = {};
    if (vqm::PhonebookParseEntryLine(begin, begin + size, &entry)) {
        // A parsed entry must fit its record: lengths in range and the fields terminated.
        if (entry.numberLength < 0 || entry.numberLength >= vqm::kPhonebookNumberSize ||
            entry.number[entry.numberLength] != '\0')
            __builtin_trap();
        if (entry.textLength < 0 || entry.textLength >= vqm::kPhonebookTextSize ||
            entry.text[entry.textLength] != '\0')
            __builtin_trap();
    }

    // Eleven slots of which the parser is given ten: the last must never be written.
    vqm::PhonebookEntry slots[11];
    std::memset(slots, 0, sizeof slots);
    slots[10].index = 0x5A5A;
    const int found = vqm::PhonebookParseRange(begin, length, slots, 10);
    if (found < 0 || found > 10 || slots[10].index != 0x5A5A) __builtin_trap();

    int32_t used = 0, total = 0, n = 0, t = 0, h = 0;
    vqm::PhonebookParseUsage(begin, length, &used, &total);
    vqm::PhonebookParseGeometry(begin, length, &n, &t, &h);
    return 0;
}
