#include "support/field_cursor.h"

#include <cstring>

#include "support/text.h"

namespace vqm {

namespace {

bool IsLineEnd(char c) {
    return c == '\r' || c == '\n';
}

bool IsBlank(char c) {
    return c == ' ' || c == '\t';
}

// The first occurrence of the n bytes of needle in [from, end), or nullptr.
const char* Search(const char* from, const char* end, const char* needle, size_t n) {
    if (n == 0 || from >= end || static_cast<size_t>(end - from) < n) return nullptr;
    const char* last = end - n;
    for (const char* p = from; p <= last; ++p) {
        p = static_cast<const char*>(std::memchr(p, needle[0], static_cast<size_t>(last - p) + 1));
        if (!p) return nullptr;
        if (std::memcmp(p, needle, n) == 0) return p;
    }
    return nullptr;
}

}  // namespace

FieldCursor::FieldCursor(const char* text, int length)
    : begin_(text), at_(text), end_(text && length > 0 ? text + length : text) {}

FieldCursor::FieldCursor(const char* begin, const char* end)
    : begin_(begin), at_(begin), end_(begin && end > begin ? end : begin) {}

int FieldCursor::NextTag(const char* tag) {
    const size_t n = tag ? std::strlen(tag) : 0;
    for (const char* from = at_;;) {
        const char* found = Search(from, end_, tag, n);
        if (!found) return 0;
        if (found == begin_ || IsLineEnd(found[-1])) {
            at_ = found + n;
            SkipBlanks();
            return 1;
        }
        from = found + 1;
    }
}

int FieldCursor::SeekPast(const char* text) {
    const size_t n = text ? std::strlen(text) : 0;
    const char* found = Search(at_, end_, text, n);
    if (!found) return 0;
    at_ = found + n;
    return 1;
}

int FieldCursor::NextLine() {
    const char* p = at_;
    while (p < end_ && !IsLineEnd(*p))
        ++p;
    while (p < end_ && IsLineEnd(*p))
        ++p;
    if (p >= end_) return 0;
    at_ = p;
    return 1;
}

void FieldCursor::SkipBlanks() {
    while (at_ < end_ && IsBlank(*at_))
        ++at_;
}

void FieldCursor::SkipSpace() {
    while (at_ < end_ && (IsBlank(*at_) || IsLineEnd(*at_)))
        ++at_;
}

int FieldCursor::NextInt(int32_t* value) {
    const char* p = at_;
    while (p < end_ && IsBlank(*p))
        ++p;
    const char* next = ParseInt(p, end_, value);
    if (!next) return 0;
    at_ = next;
    return 1;
}

int FieldCursor::CopyOut(const char* from, const char* to, char* out, size_t outSize,
                         int* length) const {
    size_t copied = 0;
    if (out && outSize > 0) {
        const size_t fieldLength = static_cast<size_t>(to - from);
        copied = fieldLength < outSize - 1 ? fieldLength : outSize - 1;
        if (copied > 0) std::memcpy(out, from, copied);
        out[copied] = '\0';
    }
    if (length) *length = static_cast<int>(copied);
    return 1;
}

namespace {

// The field reader failed: nothing of the reply is left in the caller's buffer.
int Fail(char* out, size_t outSize, int* length) {
    if (out && outSize > 0) out[0] = '\0';
    if (length) *length = 0;
    return 0;
}

}  // namespace

int FieldCursor::NextQuoted(char* out, size_t outSize, int* length) {
    const char* p = at_;
    while (p < end_ && IsBlank(*p))
        ++p;
    if (p >= end_ || *p != '"') return Fail(out, outSize, length);
    const char* body = p + 1;
    const char* close = body;
    while (close < end_ && *close != '"' && !IsLineEnd(*close))
        ++close;
    if (close >= end_ || *close != '"') return Fail(out, outSize, length);
    at_ = close + 1;
    return CopyOut(body, close, out, outSize, length);
}

int FieldCursor::SeekQuoted(char* out, size_t outSize, int* length) {
    const char* open = Search(at_, end_, "\"", 1);
    const char* close = open ? Search(open + 1, end_, "\"", 1) : nullptr;
    if (!close) return Fail(out, outSize, length);
    at_ = close + 1;
    return CopyOut(open + 1, close, out, outSize, length);
}

int FieldCursor::NextNumber(char* out, size_t outSize, int* length) {
    const char* p = at_;
    while (p < end_ && IsBlank(*p))
        ++p;
    const char* run = p;
    while (p < end_ && ((*p >= '0' && *p <= '9') || *p == '+'))
        ++p;
    if (p == run) return Fail(out, outSize, length);
    at_ = p;
    return CopyOut(run, p, out, outSize, length);
}

int FieldCursor::SkipField() {
    const char* p = at_;
    while (p < end_ && IsBlank(*p))
        ++p;
    if (p < end_ && *p == '"') {
        const char* close = p + 1;
        while (close < end_ && *close != '"' && !IsLineEnd(*close))
            ++close;
        if (close >= end_ || *close != '"') return 0;
        p = close + 1;
    }
    while (p < end_ && *p != ',' && !IsLineEnd(*p))
        ++p;
    at_ = p;
    return 1;
}

int FieldCursor::Comma() {
    return Literal(",");
}

int FieldCursor::Literal(const char* text) {
    const size_t n = text ? std::strlen(text) : 0;
    if (n == 0 || static_cast<size_t>(end_ - at_) < n || std::memcmp(at_, text, n) != 0) return 0;
    at_ += n;
    return 1;
}

int FieldCursor::AtLineEnd() const {
    return at_ >= end_ || IsLineEnd(*at_) ? 1 : 0;
}

int FieldCursor::AtEnd() const {
    return at_ >= end_ ? 1 : 0;
}

}  // namespace vqm
