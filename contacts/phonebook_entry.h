// One entry of a card phonebook ("SM" on the SIM, "ME" in the card's own memory). The same
// 80 bytes are the record of the phonebook cache files, so the layout below is a file format:
// four 32-bit little-endian integers, then the number and the name, each zero-terminated and
// zero-padded. Records are written and read raw, hence the layout checks.
#pragma once

#include <bit>
#include <cstddef>
#include <cstdint>

namespace vqm {

inline constexpr int kPhonebookNumberSize = 32;
inline constexpr int kPhonebookTextSize = 32;

struct PhonebookEntry {
    int32_t index;         // location in the storage, from 1
    int32_t type;          // type of address: 145 international, 129 other
    int32_t numberLength;  // bytes of number without the terminator; 0 marks an empty slot
    int32_t textLength;    // bytes of text without the terminator
    char number[kPhonebookNumberSize];  // 8-bit, zero-terminated
    char text[kPhonebookTextSize];      // ISO 8859-1, zero-terminated
};

inline constexpr size_t kPhonebookEntrySize = 80;

static_assert(sizeof(PhonebookEntry) == kPhonebookEntrySize);
static_assert(offsetof(PhonebookEntry, index) == 0);
static_assert(offsetof(PhonebookEntry, type) == 4);
static_assert(offsetof(PhonebookEntry, numberLength) == 8);
static_assert(offsetof(PhonebookEntry, textLength) == 12);
static_assert(offsetof(PhonebookEntry, number) == 16);
static_assert(offsetof(PhonebookEntry, text) == 48);
// Raw writes give the file's little-endian integers only on a little-endian machine.
static_assert(std::endian::native == std::endian::little);

}  // namespace vqm
