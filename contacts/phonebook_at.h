// The card's phonebooks over the 27.007 commands +CPBS, +CPBR and +CPBW: choose a storage, ask
// how full it is and how big its fields are, read one entry or a run of entries, write and delete
// one entry. Each operation is one exchange through AtCommand; the reply parsers are separate so
// that they can be tested and fuzzed on a bare buffer. All text here is the card's 8-bit text.
#pragma once

#include <cstddef>
#include <cstdint>

#include "contacts/phonebook_entry.h"

namespace vqm {

struct Link;
class SettingsStore;

// Storages are chosen by their place in this fixed table; callers hold the numbers.
inline constexpr int kPhonebookStorageCount = 8;
inline constexpr int kStorageDialledCalls = 0;  // "DC"
inline constexpr int kStorageCardPhone = 4;     // "ME", the card's own memory
inline constexpr int kStorageSimCard = 7;       // "SM"

// The two letters of a storage, or nullptr outside 0..7.
const char* PhonebookStorageName(int storage);
// The table index of a two-letter code ("SM" gives 7), -1 for a code not in the table.
int PhonebookStorageIndex(const char* code);

// Reply buffers: one line and its result, or a run of ten entries with its "OK".
inline constexpr size_t kPhonebookReplySize = 256;
inline constexpr size_t kPhonebookRangeReplySize = 1024;

// AT+CPBS="xx". -1 for a storage outside the table (nothing sent) or no reply, else the final
// result code (0 = OK).
int PhonebookSelect(Link& link, int storage);
// AT+CPBS? into used and total: 1, or 0 with the outputs written as far as the reply went.
int PhonebookGetUsage(Link& link, int32_t* used, int32_t* total);
// AT+CPBR=? into the longest number, the longest name and the highest index (all 0 first).
// -1 for no reply, else the final result code.
int PhonebookGetGeometry(Link& link, int32_t* numberLength, int32_t* textLength,
                         int32_t* highestIndex);
// AT+CPBR=index into *entry: 1 only when the whole entry line parsed. The caller zeroes the entry;
// a line cut short leaves the fields it did not reach as they were.
int PhonebookReadEntry(Link& link, int index, PhonebookEntry* entry);
// AT+CPBR=first,last into entries (last - first + 1 of them, zeroed by the caller). Entries are
// packed in the order the card lists them, so a storage with gaps leaves zeroed slots at the end.
// 1 when a reply came, whatever it held; 0 for a bad range (nothing sent) or no reply.
int PhonebookReadRange(Link& link, int first, int last, PhonebookEntry* entries);
// Selects storage ("SM", "ME", ...; an unknown code selects nothing, and the select's result is
// not looked at), then AT+CPBW=index,"number",type,"text". -1 for no reply, else the final
// result code (0 = written).
int PhonebookWriteEntry(Link& link, const char* storage, const PhonebookEntry& entry);
// The same select, then AT+CPBW=index: 1 when "OK" stands anywhere in the reply, else 0.
int PhonebookDeleteEntry(Link& link, const char* storage, int index);

// Reply parsers, each bounded by the length it is given.

// One entry line from just behind its "+CPBR:" (blanks before the index are skipped): index,
// quoted number, type, quoted text. Fields are stored as they are reached; 1 only when all four
// were read. The number and text are cut to fit their 32 bytes.
int PhonebookParseEntryLine(const char* text, const char* end, PhonebookEntry* entry);
// Every "+CPBR:" line of a reply into the next of count slots, in reply order. Returns the
// number of lines found (at most count).
int PhonebookParseRange(const char* reply, int length, PhonebookEntry* entries, int64_t count);
// The "+CPBS:" line: 1 with used and total, 0 when a piece is missing.
int PhonebookParseUsage(const char* reply, int length, int32_t* used, int32_t* total);
// The "+CPBR: (1-N),n,t" line. Outputs are only written where their piece is found.
void PhonebookParseGeometry(const char* reply, int length, int32_t* numberLength,
                            int32_t* textLength, int32_t* highestIndex);

// The learnt geometry in the settings store, under "<prefix>_nlength", "<prefix>_tlength" and
// "<prefix>_total" with prefix "sm" or "me". Save returns 1 when all three were written; Load
// returns 1 when all three were there (missing ones leave their outputs alone).
int PhonebookSaveGeometry(SettingsStore& store, const char* prefix, int32_t numberLength,
                          int32_t textLength, int32_t total);
int PhonebookLoadGeometry(SettingsStore& store, const char* prefix, int32_t* numberLength,
                          int32_t* textLength, int32_t* total);

}  // namespace vqm
