// Number and name helpers of the contacts and the call log, and the call log's
// sort comparisons.
#pragma once

#include <cstddef>
#include <cstdint>

namespace vqm {

// Converts a NUL-terminated 8-bit text, read within narrowSize bytes, into UTF-16,
// NUL-terminated within wideSize units. Returns the number of units written.
int NarrowToWideZ(const char* narrow, size_t narrowSize, char16_t* wide, size_t wideSize);

// Converts a NUL-terminated UTF-16 text into at most maxBytes bytes of ISO 8859-1,
// the NUL included (a longer text is cut). Returns the number of characters written.
int WideToNarrowBounded(const char16_t* wide, char* narrow, size_t maxBytes);

// Non-zero when the two numbers of the same length are the same number: equal byte
// for byte, an empty number matching nothing.
int NumbersMatch(const char* a, const char* b, int length);

// Copies the dialable characters of a NUL-terminated number as typed in an address
// book ("+1 (425) 555-0100" gives "+14255550100"): digits, '*', '#', and a '+' that
// opens the number. Writes at most dstSize - 1 units and a NUL; returns the count.
int CopyNumberText(const char16_t* src, char16_t* dst, size_t dstSize);

// Non-zero when a contact name is plain 7-bit printable text (0x20 to 0x7E) that every
// SIM can store. The 8-bit form takes the bytes; the UTF-16 form takes the units, its
// length given in bytes as the callers hold it.
int IsEnglishText(const char* text, size_t byteCount);
int IsEnglishText(const char16_t* text, size_t byteCount);

// Sort comparisons of the call log; negative when a goes before b.
// CompareText orders names without regard to case (A to Z with direction 0, Z to A
// with 1). CompareDateTime orders "hh:mm:ss,DD/MM/YYYY" texts by year, month, day and
// time of day: direction 0 puts the oldest first, direction 1 the newest. Texts that
// are not in that form go after every dated one, in text order.
int CompareText(int direction, const char* a, int aLength, const char* b, int bLength);
int CompareDateTime(int direction, const char* a, int aLength, const char* b, int bLength);

}  // namespace vqm
