#include "support/numbers.h"

#include <cstring>

#include "support/bounded_map.h"
#include "support/text.h"

namespace vqm {

int NarrowToWideZ(const char* narrow, size_t narrowSize, char16_t* wide, size_t wideSize) {
    int length = narrow ? static_cast<int>(strnlen(narrow, narrowSize)) : 0;
    return MapIntoBuffer(narrow, length, wide, wideSize, LatinToWide);
}

int WideToNarrowBounded(const char16_t* wide, char* narrow, size_t maxBytes) {
    // Only as much of the source is measured as can be written.
    int length = static_cast<int>(WideLength(wide, maxBytes > 0 ? maxBytes - 1 : 0));
    return MapIntoBuffer(wide, length, narrow, maxBytes, LatinOrQuestionMark);
}

int NumbersMatch(const char* a, const char* b, int length) {
    if (!a || !b || length <= 0) return 0;
    return std::memcmp(a, b, static_cast<size_t>(length)) == 0 ? 1 : 0;
}

int CopyNumberText(const char16_t* src, char16_t* dst, size_t dstSize) {
    if (!dst || dstSize == 0) return 0;
    int written = 0;
    if (src) {
        for (size_t i = 0; src[i] != u'\0' && static_cast<size_t>(written) + 1 < dstSize; ++i) {
            char16_t c = src[i];
            bool keep =
                (c >= u'0' && c <= u'9') || c == u'*' || c == u'#' || (c == u'+' && written == 0);
            if (keep) dst[written++] = c;
        }
    }
    dst[written] = u'\0';
    return written;
}

namespace {
bool IsPrintableAscii(unsigned c) {
    return c >= 0x20 && c <= 0x7E;
}
}  // namespace

int IsEnglishText(const char* text, size_t byteCount) {
    if (!text) return 0;
    for (size_t i = 0; i < byteCount; ++i)
        if (!IsPrintableAscii(static_cast<unsigned char>(text[i]))) return 0;
    return 1;
}

int IsEnglishText(const char16_t* text, size_t byteCount) {
    if (!text) return 0;
    for (size_t i = 0; i < byteCount / 2; ++i)
        if (!IsPrintableAscii(text[i])) return 0;
    return 1;
}

namespace {

int Sign(int value) {
    return (value > 0) - (value < 0);
}

int CompareBytes(const char* a, int aLength, const char* b, int bLength, bool foldCase) {
    int n = aLength < bLength ? aLength : bLength;
    for (int i = 0; i < n; ++i) {
        unsigned ca = static_cast<unsigned char>(a[i]);
        unsigned cb = static_cast<unsigned char>(b[i]);
        if (foldCase) {
            if (ca >= 'a' && ca <= 'z') ca -= 'a' - 'A';
            if (cb >= 'a' && cb <= 'z') cb -= 'a' - 'A';
        }
        if (ca != cb) return ca < cb ? -1 : 1;
    }
    return Sign(aLength - bLength);
}

// The length of a text, stopping at a NUL inside the given length.
int TextLength(const char* text, int length) {
    if (!text || length <= 0) return 0;
    const void* nul = std::memchr(text, '\0', static_cast<size_t>(length));
    return nul ? static_cast<int>(static_cast<const char*>(nul) - text) : length;
}

// Reads exactly `count` digits at text[at]; -1 when one is not a digit.
int Digits(const char* text, int at, int count) {
    int value = 0;
    for (int i = 0; i < count; ++i) {
        char c = text[at + i];
        if (c < '0' || c > '9') return -1;
        value = value * 10 + (c - '0');
    }
    return value;
}

// "hh:mm:ss,DD/MM/YYYY" to one number that grows with the moment; -1 when the text
// is not in that form.
long long DateTimeKey(const char* text, int length) {
    if (length < 19 || text[2] != ':' || text[5] != ':' || text[8] != ',' || text[11] != '/' ||
        text[14] != '/')
        return -1;
    int hour = Digits(text, 0, 2), minute = Digits(text, 3, 2), second = Digits(text, 6, 2);
    int day = Digits(text, 9, 2), month = Digits(text, 12, 2), year = Digits(text, 15, 4);
    if (hour < 0 || minute < 0 || second < 0 || day < 0 || month < 0 || year < 0) return -1;
    if (hour > 23 || minute > 59 || second > 60 || day < 1 || day > 31 || month < 1 || month > 12)
        return -1;
    return ((((static_cast<long long>(year) * 100 + month) * 100 + day) * 100 + hour) * 100 +
            minute) *
               100 +
           second;
}

}  // namespace

int CompareText(int direction, const char* a, int aLength, const char* b, int bLength) {
    aLength = TextLength(a, aLength);
    bLength = TextLength(b, bLength);
    int result = CompareBytes(a, aLength, b, bLength, true);
    if (result == 0) result = CompareBytes(a, aLength, b, bLength, false);
    return direction == 1 ? -result : result;
}

int CompareDateTime(int direction, const char* a, int aLength, const char* b, int bLength) {
    aLength = TextLength(a, aLength);
    bLength = TextLength(b, bLength);
    long long keyA = DateTimeKey(a, aLength);
    long long keyB = DateTimeKey(b, bLength);
    // Undated texts stay at the end whichever way the dated ones run.
    if ((keyA < 0) != (keyB < 0)) return keyA < 0 ? 1 : -1;
    int result = keyA < 0 ? CompareBytes(a, aLength, b, bLength, false)
                          : (keyA < keyB ? -1 : (keyA > keyB ? 1 : 0));
    if (keyA < 0) return result;
    return direction == 1 ? -result : result;
}

}  // namespace vqm
