// Message body encodings: the GSM 7-bit default alphabet (3GPP TS 23.038) and its
// septet packing (TS 23.040), UCS2 in hexadecimal, and the hexadecimal fields of PDUs.
//
// The 8-bit form of a 7-bit body is ISO 8859-1, the card's character set. The
// alphabet's Greek capitals have no ISO 8859-1 form, and the extension table
// ([ ] { } \ ^ ~ | and the euro sign) is not used because no escapes are sent, so a
// body holding any of them travels as UCS2, which keeps every character intact.
#pragma once

#include <cstddef>
#include <cstdint>

namespace vqm {

// Value of `digits` hexadecimal digits at text (upper or lower case); -1 when the
// text ends before end is reached or a character is not a hexadecimal digit.
int HexToInt(const char* text, const char* end, int digits);

// Writes `digits` uppercase hexadecimal digits of value, most significant first,
// and a NUL. Returns the number of digits, or 0 when out is too small.
int IntToHex(unsigned value, char* out, size_t outSize, int digits);

// One character of the default alphabet: the GSM code of a UTF-16 unit (-1 when it
// has none), and the UTF-16 unit of a GSM code (0x1B, the escape, has none: U+0020).
int WideToGsmCode(char16_t ch);
char16_t GsmCodeToWide(uint8_t code);

// The same for ISO 8859-1 bytes: -1 when the byte has no GSM code; and the 8-bit
// form of a code, or -1 for a code with no ISO 8859-1 form (the Greek capitals, escape).
int LatinToGsmCode(uint8_t ch);
int GsmCodeToLatin(uint8_t code);

// Packs count GSM codes (0..0x7F) as septets, least significant bit first across
// octets, written as uppercase hexadecimal and NUL-terminated. Returns the number of
// hexadecimal digits, or 0 when out cannot hold them all.
int PackGsmCodes(const uint8_t* codes, int count, char* out, size_t outSize);

// Packs a NUL-terminated ISO 8859-1 text (a record's 7-bit body); a byte without a GSM
// code goes as '?'. Returns the number of hexadecimal digits written (0 on overflow).
int PackSeptets(const char* text, char* out, size_t outSize);

// Unpacks hexLength hexadecimal digits of packed user data into GSM codes, one byte
// each (code 0x00 stays 0x00), NUL-terminated. At most maxSeptets codes are produced
// when it is 0 or more (the user-data length); with -1 every whole septet the octets
// hold. Stops at the first character that is not a hexadecimal digit.
// Returns the number of codes written.
int UnpackSeptets(const char* hex, int hexLength, char* out, size_t outSize, int maxSeptets = -1);

// Copies length ISO 8859-1 bytes into out as GSM codes (text-mode sending); bytes
// without a code go as '?'. Returns the number written (no NUL is added).
int TextToGsm(const char* text, int length, char* out, size_t outSize);

// Non-zero when every UTF-16 unit of the text (byteCount bytes) has a GSM code and an
// ISO 8859-1 form, so that the body may go as 7-bit text; 0 when UCS2 is needed.
int CanUseGsmAlphabet(const char16_t* text, size_t byteCount);

// Writes the UCS2 form of the text (byteCount bytes): four uppercase hexadecimal
// digits per unit, NUL-terminated. Returns the number of digits (0 on overflow).
int TextToUcs2Hex(const char16_t* text, size_t byteCount, char* out, size_t outSize);

// Converts hexLength hexadecimal digits, pair by pair, into bytes; stops at the first
// pair that is not hexadecimal and ignores an odd last digit. Returns the byte count.
int HexToBytes(const char* hex, int hexLength, uint8_t* out, size_t outSize);

// Builds UTF-16 text from big-endian UCS2 bytes, NUL-terminated; an odd last byte is
// ignored. Returns the number of units written.
int Ucs2BytesToWide(const uint8_t* bytes, int byteCount, char16_t* out, size_t outSize);

// GSM codes to 8-bit display text (ISO 8859-1), NUL-terminated; codes with no 8-bit
// form show as '?'. Returns the length.
int GsmToDisplay(const char* gsm, int length, char* out, size_t outSize);

// GSM codes straight to UTF-16, for panes that can show the Greek capitals.
int GsmToWide(const char* gsm, int length, char16_t* out, size_t outSize);

// The form of typed text that the message counter counts: an edit box's "\r\n" line
// break becomes the single "\n" that travels in a message. Returns the unit count.
int CountForLimit(const char16_t* text, int count, char16_t* out, size_t outSize);

// CanUseGsmAlphabet on the counted form.
int CanUseGsmAlphabetCounted(const char16_t* text, size_t byteCount);

// Non-zero when the NUL-terminated text is a number a message may be sent to:
// only digits, '+', '*', '#', blanks, '-', '(' and ')', with 1 to 20 digits in all,
// and no more than 64 characters.
int IsValidPhoneNumber(const char16_t* text);

}  // namespace vqm
