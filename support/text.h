// Text conversion between the card's 8-bit texts and the interface's UTF-16 texts,
// and the field walk over AT replies. Nothing here allocates; every routine is told
// the size of each buffer it reads or writes and never goes past it.
#pragma once

#include <cstddef>
#include <cstdint>
#include <string>

namespace vqm {

// Converts count UTF-16 units of wide into ISO 8859-1 bytes in narrow and
// NUL-terminates. Units above 0xFF have no 8-bit form and become '?'.
// At most narrowSize - 1 characters are written. Returns the number written.
int WideToNarrow(const char16_t* wide, char* narrow, int count, size_t narrowSize);

// Converts count ISO 8859-1 bytes of narrow into UTF-16 in wide, NUL-terminated.
// At most wideSize - 1 units are written. Returns the number written.
int NarrowToWide(const char* narrow, char16_t* wide, int count, size_t wideSize);

// Offset of the first occurrence of the patternLength bytes of pattern at or after
// start within the first bufferLength bytes of buffer; -1 when there is none.
int FindPattern(int start, const char* pattern, int patternLength, const char* buffer,
                int bufferLength);

// Removes the CR and LF bytes that open a reply, in place, and updates *length.
void TrimReply(char* buffer, int* length);

// Reads a decimal integer (an optional '-' then digits) at text, never reading at or
// past end. Stores it in *value, saturated to the 32-bit range, and returns a pointer
// to the first character after the digits; nullptr when no digit is there.
const char* ParseInt(const char* text, const char* end, int32_t* value);

// Finds the next double-quoted field at or after text (before end) and copies what
// stands between the quotes into out, NUL-terminated; a field longer than
// outSize - 1 is cut. *length gets the number of characters copied. Returns a pointer
// just past the closing quote, or nullptr when no complete quoted field is there.
const char* ParseQuoted(const char* text, const char* end, char* out, size_t outSize, int* length);

// One character each way between UTF-16 and ISO 8859-1 ('?' where there is no 8-bit form).
char LatinOrQuestionMark(char16_t ch);
char16_t LatinToWide(char ch);

// Length of a NUL-terminated UTF-16 text, reading at most maxCount units.
size_t WideLength(const char16_t* text, size_t maxCount);

// UTF-8 <-> UTF-16 for file names, command lines and the settings tool. Invalid input
// is replaced by U+FFFD rather than rejected.
std::u16string Utf8ToUtf16(const std::string& text);
std::string Utf16ToUtf8(const std::u16string& text);

}  // namespace vqm
