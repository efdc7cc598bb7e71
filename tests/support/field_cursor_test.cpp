#include "support/field_cursor.h"

#include <gtest/gtest.h>

#include <cstring>
#include <sstream>
#include <string>
#include <vector>

namespace vqm {
namespace {

// Runs a walk over a reply and writes down what each step gave, so that a table row reads as
// reply, walk, outcome. Steps: T<tag> NextTag, S<text> SeekPast, i NextInt, q NextQuoted,
// Q SeekQuoted, n NextNumber, s SkipField, , Comma, L NextLine, _ SkipSpace, e AtLineEnd.
// A failed step writes "!" and the walk goes on from where the cursor stayed.
std::string Walk(const std::string& reply, const std::string& steps) {
    // Exactly the reply's bytes, no terminator behind them.
    std::vector<char> bytes(reply.begin(), reply.end());
    FieldCursor cursor(bytes.data(), static_cast<int>(bytes.size()));
    std::istringstream in(steps);
    std::string step, out;
    while (in >> step) {
        std::string got;
        char text[64];
        int length = -1;
        int32_t value = 0;
        switch (step[0]) {
            case 'T':
                got = cursor.NextTag(step.c_str() + 1) ? "T" : "!";
                break;
            case 'S':
                got = cursor.SeekPast(step.c_str() + 1) ? "S" : "!";
                break;
            case 'i':
                got = cursor.NextInt(&value) ? std::to_string(value) : "!";
                break;
            case 'q':
            case 'Q':
            case 'n': {
                const int ok = step[0] == 'q'   ? cursor.NextQuoted(text, sizeof text, &length)
                               : step[0] == 'Q' ? cursor.SeekQuoted(text, sizeof text, &length)
                                                : cursor.NextNumber(text, sizeof text, &length);
                EXPECT_EQ(static_cast<size_t>(length), std::strlen(text));
                got = ok ? "<" + std::string(text) + ">" : "!";
                break;
            }
            case 's':
                got = cursor.SkipField() ? "s" : "!";
                break;
            case ',':
                got = cursor.Comma() ? "," : "!";
                break;
            case 'L':
                got = cursor.NextLine() ? "L" : "!";
                break;
            case '_':
                cursor.SkipSpace();
                continue;
            case 'e':
                got = cursor.AtLineEnd() ? "eol" : "more";
                break;
            default:
                ADD_FAILURE() << "unknown step " << step;
        }
        out += (out.empty() ? "" : " ") + got;
    }
    return out;
}

struct Row {
    const char* what;
    std::string reply;
    const char* steps;
    const char* outcome;
};

TEST(FieldCursor, WalksRealReplies) {
    const Row rows[] = {
        {"card call list", "\r\n+CLCC: 1,1,4,0,0,\"+447700900123\",145\r\n\r\nOK\r\n",
         "T+CLCC: i , i , i , i , i , q , i e", "T 1 , 1 , 4 , 0 , 0 , <+447700900123> , 145 eol"},
        {"standard call list, empty alpha field", "+CLCC: 1,0,2,0,0,\"112\",129,\"\"\r\n",
         "T+CLCC: i , s , s , s , s , s , s , q e", "T 1 , s , s , s , s , s , s , <> eol"},
        {"second record of a list", "+CLCC: 1,0,0,0,0\r\n+CLCC: 2,1,5,0,0\r\nOK\r\n",
         "T+CLCC: T+CLCC: i , i , i", "T T 2 , 1 , 5"},
        {"no blank after the tag", "+CSQ:20,99\r\n", "T+CSQ: i , i e", "T 20 , 99 eol"},
        {"tag inside a name is not a tag", "+CPBR: 1,\"x+CMTI: \",129\r\n", "T+CMTI:", "!"},
        {"tag after the echo", "AT+CLVL?\r\r\n+CLVL: 7\r\n", "T+CLVL: i", "T 7"},
        {"seek finds a tag anywhere", "xx+CLVL: 7", "S+CLVL: i", "S 7"},
        {"negative and huge numbers", "+X: -5,99999999999\r\n", "T+X: i , i", "T -5 , 2147483647"},
        {"a sign alone is no number", "+X: -,5", "T+X: i s , i", "T ! s , 5"},
        {"failed int leaves the cursor", "+X: \"a\",1", "T+X: i q , i", "T ! <a> , 1"},
        {"unclosed quote stays on its line", "+X: \"abc\r\n\"d\"", "T+X: q s", "T ! !"},
        {"seek quoted runs over lines", "+X: \"abc\r\n\"d\"", "T+X: Q", "T <abc\r\n>"},
        {"seek quoted without a pair", "+X: 1,\"abc", "T+X: Q i", "T ! 1"},
        {"quoted after blanks", "+X:   \"ab\" ,1", "T+X: q , s , i", "T <ab> ! s , 1"},
        {"comma inside quotes is not a separator", "+X: \"a,b\",7", "T+X: s , i", "T s , 7"},
        {"empty fields", "+COPS: 0,,,", "T+COPS: i , s , s , s e", "T 0 , s , s , s eol"},
        {"bare number", "+CLIP: +4477009,145", "T+CLIP: n , i", "T <+4477009> , 145"},
        {"no number there", "+CLIP: ,145", "T+CLIP: n , i", "T ! , 145"},
        {"number after a line break", "+CLIP:\r\n 123,129", "T+CLIP: _ n", "T <123>"},
        {"lines", "a\r\n\r\nb\r\n", "L e Sb e L", "L more S eol !"},
        {"nothing at all", "", "T+X: S+X i q Q n , e", "! ! ! ! ! ! ! eol"},
        {"reply cut inside the tag", "\r\n+CLC", "T+CLCC:", "!"},
        {"reply cut inside a field", "+X: \"ab", "T+X: q", "T !"},
    };
    for (const Row& row : rows)
        EXPECT_EQ(Walk(row.reply, row.steps), row.outcome) << row.what;
}

TEST(FieldCursor, TextFieldsStayWithinTheCallersBuffer) {
    const std::string reply = "+X: \"4915112345678\",4915112345678";
    FieldCursor cursor(reply.data(), static_cast<int>(reply.size()));
    ASSERT_TRUE(cursor.NextTag("+X:"));
    char small[6];
    std::memset(small, '#', sizeof small);
    int length = -1;
    EXPECT_EQ(cursor.NextQuoted(small, sizeof small, &length), 1);
    EXPECT_STREQ(small, "49151");
    EXPECT_EQ(length, 5);
    EXPECT_EQ(cursor.Comma(), 1);
    char one[1] = {'#'};
    EXPECT_EQ(cursor.NextNumber(one, sizeof one, &length), 1);  // read, but nothing fits
    EXPECT_EQ(one[0], '\0');
    EXPECT_EQ(length, 0);
    EXPECT_EQ(cursor.AtEnd(), 1);
    // A failed read empties the buffer rather than leaving an earlier field in it.
    EXPECT_EQ(cursor.NextQuoted(small, sizeof small, &length), 0);
    EXPECT_STREQ(small, "");
    // No buffer at all: the field is still stepped over.
    FieldCursor again(reply.data(), static_cast<int>(reply.size()));
    EXPECT_EQ(again.SeekQuoted(nullptr, 0, nullptr), 1);
    EXPECT_EQ(*again.Position(), ',');
}

TEST(FieldCursor, EmptyOrNullTextReadsNothing) {
    const char abc[] = "abc";
    for (FieldCursor cursor : {FieldCursor(nullptr, 5), FieldCursor(abc, 0), FieldCursor(abc, -1),
                               FieldCursor(abc + 2, abc)}) {
        int32_t value = 7;
        EXPECT_EQ(cursor.NextInt(&value), 0);
        EXPECT_EQ(value, 7);
        EXPECT_EQ(cursor.SkipField(), 1);  // an empty field
        EXPECT_EQ(cursor.AtEnd(), 1);
        EXPECT_EQ(cursor.NextTag(""), 0);
        EXPECT_EQ(cursor.Literal(""), 0);
    }
}

}  // namespace
}  // namespace vqm
