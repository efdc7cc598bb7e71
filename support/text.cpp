#include "support/text.h"

#include <climits>
#include <cstring>

#include "support/bounded_map.h"

namespace vqm {

char LatinOrQuestionMark(char16_t ch) {
    return ch <= 0xFF ? static_cast<char>(ch) : '?';
}

char16_t LatinToWide(char ch) {
    return static_cast<unsigned char>(ch);
}

int WideToNarrow(const char16_t* wide, char* narrow, int count, size_t narrowSize) {
    return MapIntoBuffer(wide, count, narrow, narrowSize, LatinOrQuestionMark);
}

int NarrowToWide(const char* narrow, char16_t* wide, int count, size_t wideSize) {
    return MapIntoBuffer(narrow, count, wide, wideSize, LatinToWide);
}

int FindPattern(int start, const char* pattern, int patternLength, const char* buffer,
                int bufferLength) {
    if (!pattern || !buffer || patternLength <= 0 || start < 0) return -1;
    // The last position where the whole pattern still lies inside the buffer.
    int last = bufferLength - patternLength;
    for (int i = start; i <= last; ++i) {
        if (buffer[i] == pattern[0] &&
            std::memcmp(buffer + i, pattern, static_cast<size_t>(patternLength)) == 0)
            return i;
    }
    return -1;
}

void TrimReply(char* buffer, int* length) {
    if (!buffer || !length || *length <= 0) return;
    int skip = 0;
    while (skip < *length && (buffer[skip] == '\r' || buffer[skip] == '\n'))
        ++skip;
    if (skip == 0) return;
    std::memmove(buffer, buffer + skip, static_cast<size_t>(*length - skip));
    *length -= skip;
    buffer[*length] = '\0';  // inside the old length, so always within the buffer
}

const char* ParseInt(const char* text, const char* end, int32_t* value) {
    if (!text || !end || text >= end) return nullptr;
    const char* p = text;
    bool negative = false;
    if (*p == '-') {
        negative = true;
        ++p;
    }
    if (p >= end || *p < '0' || *p > '9') return nullptr;
    // Accumulate in 64 bits and stop growing at the limit, so 40 digits saturate
    // instead of overflowing; all digits are still consumed.
    const int64_t limit = negative ? -static_cast<int64_t>(INT32_MIN) : INT32_MAX;
    int64_t result = 0;
    while (p < end && *p >= '0' && *p <= '9') {
        if (result < limit) {
            result = result * 10 + (*p - '0');
            if (result > limit) result = limit;
        }
        ++p;
    }
    if (value) *value = static_cast<int32_t>(negative ? -result : result);
    return p;
}

const char* ParseQuoted(const char* text, const char* end, char* out, size_t outSize, int* length) {
    if (!text || !end || text >= end) return nullptr;
    const char* open = static_cast<const char*>(std::memchr(text, '"', end - text));
    if (!open) return nullptr;
    const char* body = open + 1;
    const char* close = static_cast<const char*>(std::memchr(body, '"', end - body));
    if (!close) return nullptr;
    size_t fieldLength = static_cast<size_t>(close - body);
    size_t copied = 0;
    if (out && outSize > 0) {
        copied = fieldLength < outSize - 1 ? fieldLength : outSize - 1;
        std::memcpy(out, body, copied);
        out[copied] = '\0';
    }
    if (length) *length = static_cast<int>(copied);
    return close + 1;
}

size_t WideLength(const char16_t* text, size_t maxCount) {
    if (!text) return 0;
    size_t n = 0;
    while (n < maxCount && text[n] != u'\0')
        ++n;
    return n;
}

std::u16string Utf8ToUtf16(const std::string& text) {
    std::u16string out;
    out.reserve(text.size());
    size_t i = 0;
    const size_t n = text.size();
    auto byte = [&](size_t k) { return static_cast<unsigned char>(text[k]); };
    while (i < n) {
        unsigned char c = byte(i);
        char32_t cp;
        size_t extra;
        if (c < 0x80) {
            cp = c;
            extra = 0;
        } else if ((c & 0xE0) == 0xC0) {
            cp = c & 0x1F;
            extra = 1;
        } else if ((c & 0xF0) == 0xE0) {
            cp = c & 0x0F;
            extra = 2;
        } else if ((c & 0xF8) == 0xF0) {
            cp = c & 0x07;
            extra = 3;
        } else {
            out.push_back(u'\uFFFD');
            ++i;
            continue;
        }
        bool ok = true;
        for (size_t k = 1; k <= extra; ++k) {
            if (i + k >= n || (byte(i + k) & 0xC0) != 0x80) {
                ok = false;
                break;
            }
            cp = (cp << 6) | (byte(i + k) & 0x3F);
        }
        static const char32_t kMin[] = {0, 0x80, 0x800, 0x10000};
        if (!ok || cp < kMin[extra] || cp > 0x10FFFF || (cp >= 0xD800 && cp <= 0xDFFF)) {
            out.push_back(u'\uFFFD');
            ++i;
            continue;
        }
        i += extra + 1;
        if (cp >= 0x10000) {
            cp -= 0x10000;
            out.push_back(static_cast<char16_t>(0xD800 + (cp >> 10)));
            out.push_back(static_cast<char16_t>(0xDC00 + (cp & 0x3FF)));
        } else {
            out.push_back(static_cast<char16_t>(cp));
        }
    }
    return out;
}

std::string Utf16ToUtf8(const std::u16string& text) {
    std::string out;
    out.reserve(text.size());
    for (size_t i = 0; i < text.size(); ++i) {
        char32_t cp = text[i];
        if (cp >= 0xD800 && cp <= 0xDBFF && i + 1 < text.size() && text[i + 1] >= 0xDC00 &&
            text[i + 1] <= 0xDFFF) {
            cp = 0x10000 + ((cp - 0xD800) << 10) + (text[i + 1] - 0xDC00);
            ++i;
        } else if (cp >= 0xD800 && cp <= 0xDFFF) {
            cp = 0xFFFD;
        }
        if (cp < 0x80) {
            out.push_back(static_cast<char>(cp));
        } else if (cp < 0x800) {
            out.push_back(static_cast<char>(0xC0 | (cp >> 6)));
            out.push_back(static_cast<char>(0x80 | (cp & 0x3F)));
        } else if (cp < 0x10000) {
            out.push_back(static_cast<char>(0xE0 | (cp >> 12)));
            out.push_back(static_cast<char>(0x80 | ((cp >> 6) & 0x3F)));
            out.push_back(static_cast<char>(0x80 | (cp & 0x3F)));
        } else {
            out.push_back(static_cast<char>(0xF0 | (cp >> 18)));
            out.push_back(static_cast<char>(0x80 | ((cp >> 12) & 0x3F)));
            out.push_back(static_cast<char>(0x80 | ((cp >> 6) & 0x3F)));
            out.push_back(static_cast<char>(0x80 | (cp & 0x3F)));
        }
    }
    return out;
}

}  // namespace vqm
