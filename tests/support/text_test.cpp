#include "support/text.h"

#include <gtest/gtest.h>

#include <cstring>
#include <string>

namespace vqm {
namespace {

TEST(FindPattern, RespectsBufferLengthAndStart) {
    const char buffer[] = "\r\n+CSQ: 20,0\r\n\r\nOK\r\nOK\r\n";
    const int length = static_cast<int>(std::strlen(buffer));
    EXPECT_EQ(FindPattern(0, "+CSQ:", 5, buffer, length), 2);
    // A pattern ending exactly at the buffer's end is found...
    EXPECT_EQ(FindPattern(0, "OK\r\n", 4, buffer, length), 16);
    EXPECT_EQ(FindPattern(16 + 4, "OK\r\n", 4, buffer, length), 20);
    EXPECT_EQ(FindPattern(0, "OK\r\nOK\r\n", 8, buffer, 24), 16);
    // ...one that would run past the given length is not, whatever follows in memory.
    EXPECT_EQ(FindPattern(0, "OK\r\nOK\r\n", 8, buffer, 23), -1);
    EXPECT_EQ(FindPattern(0, "ok", 2, buffer, length), -1);
    EXPECT_EQ(FindPattern(length, "O", 1, buffer, length), -1);
    EXPECT_EQ(FindPattern(0, "", 0, buffer, length), -1);
    EXPECT_EQ(FindPattern(-3, "+", 1, buffer, length), -1);
}

TEST(FindPattern, ReplyWithoutTerminator) {
    char buffer[8];
    std::memcpy(buffer, "ABCDEFGH", 8);  // no NUL anywhere
    EXPECT_EQ(FindPattern(0, "GH", 2, buffer, 8), 6);
    EXPECT_EQ(FindPattern(0, "H", 1, buffer, 7), -1);
}

TEST(TrimReply, RemovesOnlyLeadingLineEnds) {
    char reply[] = "\r\n\n\rSW4.00\r\n\r\nOK\r\n";
    int length = static_cast<int>(std::strlen(reply));
    TrimReply(reply, &length);
    EXPECT_EQ(length, 14);
    EXPECT_EQ(std::string(reply, length), "SW4.00\r\n\r\nOK\r\n");

    char plain[] = "OK\r\n";
    length = 4;
    TrimReply(plain, &length);
    EXPECT_EQ(length, 4);
    EXPECT_STREQ(plain, "OK\r\n");

    char onlyEnds[] = "\r\n\r\n";
    length = 4;
    TrimReply(onlyEnds, &length);
    EXPECT_EQ(length, 0);
    EXPECT_EQ(onlyEnds[0], '\0');
}

TEST(ParseInt, StopsAtTheFirstNonDigit) {
    const char text[] = "12,3";
    int32_t value = -1;
    const char* next = ParseInt(text, text + 4, &value);
    ASSERT_NE(next, nullptr);
    EXPECT_EQ(value, 12);
    EXPECT_EQ(*next, ',');
    next = ParseInt(next + 1, text + 4, &value);
    EXPECT_EQ(value, 3);
    EXPECT_EQ(next, text + 4);
}

TEST(ParseInt, RejectsTextWithoutDigitsAndKeepsTheValue) {
    int32_t value = 77;
    const char quote[] = "\"x\"";
    EXPECT_EQ(ParseInt(quote, quote + 3, &value), nullptr);
    const char minus[] = "-,";
    EXPECT_EQ(ParseInt(minus, minus + 2, &value), nullptr);
    EXPECT_EQ(ParseInt(quote, quote, &value), nullptr);
    EXPECT_EQ(value, 77);
}

TEST(ParseInt, NeverReadsPastEndAndSaturates) {
    const char digits[] = "12345";
    int32_t value = 0;
    EXPECT_EQ(ParseInt(digits, digits + 2, &value), digits + 2);
    EXPECT_EQ(value, 12);

    std::string forty(40, '9');
    const char* end = forty.data() + forty.size();
    EXPECT_EQ(ParseInt(forty.data(), end, &value), end);
    EXPECT_EQ(value, INT32_MAX);

    std::string negative = "-" + forty + ",";
    EXPECT_EQ(*ParseInt(negative.data(), negative.data() + negative.size(), &value), ',');
    EXPECT_EQ(value, INT32_MIN);

    const char minusOne[] = "-1";
    ParseInt(minusOne, minusOne + 2, &value);
    EXPECT_EQ(value, -1);
}

TEST(ParseQuoted, AdjacentQuotesGiveAnEmptyField) {
    const char text[] = "\"\",145";
    char out[8] = "junk";
    int length = -1;
    const char* next = ParseQuoted(text, text + 6, out, sizeof out, &length);
    EXPECT_EQ(next, text + 2);
    EXPECT_EQ(length, 0);
    EXPECT_STREQ(out, "");
}

TEST(ParseQuoted, FindsTheNextFieldAndCutsToTheBuffer) {
    const char text[] = " 0,\"+441234567\",145";
    const char* end = text + std::strlen(text);
    char out[32];
    int length = 0;
    const char* next = ParseQuoted(text, end, out, sizeof out, &length);
    ASSERT_NE(next, nullptr);
    EXPECT_STREQ(out, "+441234567");
    EXPECT_EQ(length, 10);
    EXPECT_EQ(*next, ',');

    char small[5];
    next = ParseQuoted(text, end, small, sizeof small, &length);
    EXPECT_STREQ(small, "+441");
    EXPECT_EQ(length, 4);
    EXPECT_EQ(*next, ',');  // the whole field is still stepped over
}

TEST(ParseQuoted, IncompleteFieldsFail) {
    char out[16] = "keep";
    int length = 5;
    const char open[] = "1,\"abc";
    EXPECT_EQ(ParseQuoted(open, open + 6, out, sizeof out, &length), nullptr);
    // The closing quote lies beyond the given end.
    const char late[] = "\"ab\"";
    EXPECT_EQ(ParseQuoted(late, late + 3, out, sizeof out, &length), nullptr);
    const char none[] = "123";
    EXPECT_EQ(ParseQuoted(none, none + 3, out, sizeof out, &length), nullptr);
}

// The way every AT wrapper walks a reply: tag, then field by field, each followed by ','.
TEST(FieldWalk, CallListLine) {
    const char reply[] = "\r\n+CLCC: 1,1,4,0,0,\"+447700900123\",145\r\n\r\nOK\r\n";
    const char* end = reply + std::strlen(reply);
    int tag = FindPattern(0, "+CLCC:", 6, reply, static_cast<int>(end - reply));
    ASSERT_GE(tag, 0);
    int32_t fields[5];
    const char* p = reply + tag + 6;
    while (*p == ' ')
        ++p;
    for (int i = 0; i < 5; ++i) {
        p = ParseInt(p, end, &fields[i]);
        ASSERT_NE(p, nullptr);
        ASSERT_EQ(*p, ',');
        ++p;
    }
    char number[32];
    int length = 0;
    p = ParseQuoted(p, end, number, sizeof number, &length);
    ASSERT_NE(p, nullptr);
    EXPECT_EQ(fields[2], 4);
    EXPECT_EQ(fields[3], 0);
    EXPECT_STREQ(number, "+447700900123");
}

TEST(Conversion, LatinRoundTripAndBounds) {
    char16_t wide[256];
    for (int i = 0; i < 255; ++i)
        wide[i] = static_cast<char16_t>(i + 1);
    char narrow[256];
    EXPECT_EQ(WideToNarrow(wide, narrow, 255, sizeof narrow), 255);
    char16_t back[256];
    EXPECT_EQ(NarrowToWide(narrow, back, 255, 256), 255);
    EXPECT_EQ(std::u16string(back), std::u16string(wide, 255));

    const char16_t outside[] = u"a\u20ACb\u0394";
    EXPECT_EQ(WideToNarrow(outside, narrow, 4, sizeof narrow), 4);
    EXPECT_STREQ(narrow, "a?b?");

    // A count larger than the buffer is cut, and the terminator still fits.
    char tiny[4] = {'x', 'x', 'x', 'x'};
    EXPECT_EQ(WideToNarrow(u"abcdef", tiny, 6, sizeof tiny), 3);
    EXPECT_STREQ(tiny, "abc");
    char16_t tinyWide[3];
    EXPECT_EQ(NarrowToWide("\xE9\xFF"
                           "z",
                           tinyWide, 3, 3),
              2);
    EXPECT_EQ(tinyWide[0], u'\u00E9');
    EXPECT_EQ(tinyWide[1], u'\u00FF');
    EXPECT_EQ(tinyWide[2], u'\0');
}

TEST(Conversion, Utf8AndUtf16) {
    const std::u16string text = u"Caf\u00E9 \u0394 \u20AC \U0001F4DE";
    EXPECT_EQ(Utf8ToUtf16(Utf16ToUtf8(text)), text);
    EXPECT_EQ(Utf16ToUtf8(u"\u00E9"), "\xC3\xA9");
    // Broken input becomes replacement characters instead of being dropped silently.
    EXPECT_EQ(Utf8ToUtf16("a\xFF"
                          "b"),
              u"a\uFFFDb");
    EXPECT_EQ(Utf8ToUtf16("\xE2\x82"), u"\uFFFD\uFFFD");
    EXPECT_EQ(Utf8ToUtf16("\xC0\x80"), u"\uFFFD\uFFFD");  // overlong NUL
    EXPECT_EQ(WideLength(u"abc", 2), 2u);
    EXPECT_EQ(WideLength(u"abc", 10), 3u);
}

}  // namespace
}  // namespace vqm
