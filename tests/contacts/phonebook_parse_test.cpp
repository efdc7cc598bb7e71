// The phonebook reply parsers on hand-written replies. Each reply is copied into a buffer of
// exactly its length, so a read past the end shows up under the address sanitizer.
#include <gtest/gtest.h>

#include <climits>
#include <cstring>
#include <string>
#include <vector>

#include "contacts/phonebook_at.h"

namespace vqm {
namespace {

struct Reply {
    explicit Reply(const std::string& text) : bytes(text.begin(), text.end()) {}
    const char* begin() const { return bytes.data(); }
    const char* end() const { return bytes.data() + bytes.size(); }
    int length() const { return static_cast<int>(bytes.size()); }
    std::vector<char> bytes;
};

std::string Number(const PhonebookEntry& e) {
    return std::string(e.number, e.numberLength);
}
std::string Text(const PhonebookEntry& e) {
    return std::string(e.text, e.textLength);
}

// Marks every field so that a field the parser did not reach is recognisable.
PhonebookEntry Marked() {
    PhonebookEntry e;
    std::memset(&e, 0, sizeof e);
    e.index = e.type = e.numberLength = e.textLength = -7;
    std::strcpy(e.number, "untouched");
    std::strcpy(e.text, "untouched");
    return e;
}

TEST(PhonebookEntryLine, ReadsTheFourFieldsWithLatinName) {
    Reply line(" 17,\"+447700900123\",145,\"Chlo\xE9 Martin\"\r\n\r\nOK\r\n");
    PhonebookEntry e = Marked();
    ASSERT_EQ(PhonebookParseEntryLine(line.begin(), line.end(), &e), 1);
    EXPECT_EQ(e.index, 17);
    EXPECT_EQ(Number(e), "+447700900123");
    EXPECT_EQ(e.numberLength, 13);
    EXPECT_EQ(e.type, 145);
    EXPECT_EQ(Text(e), "Chlo\xE9 Martin");
    EXPECT_EQ(e.text[e.textLength], '\0');

    Reply empty("3,\"\",129,\"\"");
    e = Marked();
    ASSERT_EQ(PhonebookParseEntryLine(empty.begin(), empty.end(), &e), 1);
    EXPECT_EQ(e.numberLength, 0);
    EXPECT_EQ(e.textLength, 0);
}

// Cutting a good line anywhere must fail, and the fields written must be exactly a prefix of
// the four: never a later field without the earlier ones, never a value other than the true one.
TEST(PhonebookEntryLine, LineCutAnywhereWritesOnlyTheFieldsReached) {
    const std::string full = " 42,\"01632960001\",129,\"Home\"";
    for (size_t cut = 0; cut < full.size(); ++cut) {
        Reply line(full.substr(0, cut));
        PhonebookEntry e = Marked();
        EXPECT_EQ(PhonebookParseEntryLine(line.begin(), line.end(), &e), 0) << "cut " << cut;
        const bool index = e.index != -7, number = e.numberLength != -7, type = e.type != -7,
                   text = e.textLength != -7;
        EXPECT_TRUE(!number || index) << cut;
        EXPECT_TRUE(!type || number) << cut;
        EXPECT_FALSE(text) << cut;
        // A cut inside "42" or "129" gives the digits before it.
        if (index) {
            EXPECT_TRUE(e.index == 42 || e.index == 4) << cut;
        }
        if (number) {
            EXPECT_EQ(Number(e), "01632960001") << cut;
        } else {
            EXPECT_STREQ(e.number, "untouched") << cut;
        }
        if (type) {
            EXPECT_TRUE(e.type == 129 || e.type == 12 || e.type == 1) << cut;
        }
        EXPECT_STREQ(e.text, "untouched") << cut;
    }
}

TEST(PhonebookEntryLine, MalformedSeparatorsFail) {
    struct Case {
        const char* line;
        int index;  // what the index field holds afterwards (-7 untouched)
    };
    const Case cases[] = {
        {"", -7},
        {"x,\"1\",129,\"a\"", -7},
        {"5;\"123\",129,\"a\"", 5},  // wrong separator after the index
        {"5,123,129,\"a\"", 5},      // number not quoted: the quoted name is taken, then no ','
        {"5,\"123\";129,\"a\"", 5},  // wrong separator after the number
        {"5,\"123\",,\"a\"", 5},     // type missing
        {"5,\"123\",129;\"a\"", 5},  // wrong separator after the type
        {"5,\"123\",129,a", 5},      // name not quoted
        {"5,\"123\",129,\"unclosed", 5},  // name never closed
    };
    for (const Case& c : cases) {
        Reply line(c.line);
        PhonebookEntry e = Marked();
        EXPECT_EQ(PhonebookParseEntryLine(line.begin(), line.end(), &e), 0) << c.line;
        EXPECT_EQ(e.index, c.index) << c.line;
        EXPECT_EQ(e.textLength, -7) << c.line;
    }
    PhonebookEntry e = Marked();
    EXPECT_EQ(PhonebookParseEntryLine(nullptr, nullptr, &e), 0);
}

TEST(PhonebookEntryLine, OversizeFieldsAreCutToTheRecord) {
    const std::string digits(60, '9'), name(45, 'N');
    Reply line("99999999999999999999,\"" + digits + "\",-12,\"" + name + "\"");
    PhonebookEntry e = Marked();
    ASSERT_EQ(PhonebookParseEntryLine(line.begin(), line.end(), &e), 1);
    EXPECT_EQ(e.index, INT32_MAX);
    EXPECT_EQ(e.numberLength, kPhonebookNumberSize - 1);
    EXPECT_EQ(e.number[kPhonebookNumberSize - 1], '\0');
    EXPECT_EQ(Number(e), digits.substr(0, kPhonebookNumberSize - 1));
    EXPECT_EQ(e.type, -12);
    EXPECT_EQ(e.textLength, kPhonebookTextSize - 1);
    EXPECT_EQ(e.text[kPhonebookTextSize - 1], '\0');
}

TEST(PhonebookRange, PacksLinesInReplyOrderAndNeverPassesTheSlots) {
    Reply reply(
        "\r\n+CPBR: 2,\"+447700900123\",145,\"Alice\"\r\n"
        "\r\n+CPBR: 5,\"0123\",129,\"Bob\"\r\n"
        "\r\n+CPBR: 9,\"0456\",129,\"Carol\"\r\n\r\nOK\r\n");
    PhonebookEntry slots[10] = {};
    EXPECT_EQ(PhonebookParseRange(reply.begin(), reply.length(), slots, 10), 3);
    EXPECT_EQ(slots[0].index, 2);
    EXPECT_EQ(Text(slots[0]), "Alice");
    EXPECT_EQ(slots[1].index, 5);
    EXPECT_EQ(slots[2].index, 9);
    EXPECT_EQ(Text(slots[2]), "Carol");
    const PhonebookEntry zero = {};
    for (int i = 3; i < 10; ++i)
        EXPECT_EQ(std::memcmp(&slots[i], &zero, sizeof zero), 0) << i;

    // Twelve lines for two slots: the third slot (outside the caller's count) stays as it was.
    std::string many;
    for (int i = 1; i <= 12; ++i)
        many += "\r\n+CPBR: " + std::to_string(i) + ",\"1\",129,\"x\"\r\n";
    Reply manyReply(many);
    PhonebookEntry three[3] = {};
    three[2].index = 77;
    EXPECT_EQ(PhonebookParseRange(manyReply.begin(), manyReply.length(), three, 2), 2);
    EXPECT_EQ(three[1].index, 2);
    EXPECT_EQ(three[2].index, 77);
}

TEST(PhonebookRange, ABrokenLineTakesItsSlot) {
    Reply reply(
        "\r\n+CPBR: 1,\"111\",129,\"One\"\r\n"
        "\r\n+CPBR: garbage\r\n"
        "\r\n+CPBR: 3,\"333\",129,\"Three\"\r\n\r\nOK\r\n");
    PhonebookEntry slots[4] = {};
    EXPECT_EQ(PhonebookParseRange(reply.begin(), reply.length(), slots, 4), 3);
    EXPECT_EQ(slots[0].index, 1);
    EXPECT_EQ(slots[1].numberLength, 0);  // an empty slot to the caller
    EXPECT_EQ(slots[2].index, 3);
    EXPECT_EQ(Text(slots[2]), "Three");
}

TEST(PhonebookUsage, ReadsUsedAndTotalOrStopsAtTheMissingPiece) {
    int32_t used = -1, total = -1;
    Reply good("\r\n+CPBS: \"SM\",8,250\r\n\r\nOK\r\n");
    EXPECT_EQ(PhonebookParseUsage(good.begin(), good.length(), &used, &total), 1);
    EXPECT_EQ(used, 8);
    EXPECT_EQ(total, 250);

    used = total = -1;
    Reply noTotal("\r\n+CPBS: \"SM\",8\r\n");
    EXPECT_EQ(PhonebookParseUsage(noTotal.begin(), noTotal.length(), &used, &total), 0);
    EXPECT_EQ(used, 8);
    EXPECT_EQ(total, -1);

    for (const char* bad : {"\r\nOK\r\n", "\r\n+CPBS: SM,8,250\r\n", "+CPBS: \"SM\";8,250",
                            "+CPBS: \"SM\",,250", "+CPBS: \"SM"}) {
        used = total = -1;
        Reply reply(bad);
        EXPECT_EQ(PhonebookParseUsage(reply.begin(), reply.length(), &used, &total), 0) << bad;
        EXPECT_EQ(used, -1) << bad;
        EXPECT_EQ(total, -1) << bad;
    }
}

TEST(PhonebookGeometry, HighestIndexOnlyForARangeFromOne) {
    int32_t n = 0, t = 0, h = 0;
    Reply sim("\r\n+CPBR: (1-250),40,14\r\n\r\nOK\r\n");
    PhonebookParseGeometry(sim.begin(), sim.length(), &n, &t, &h);
    EXPECT_EQ(h, 250);
    EXPECT_EQ(n, 40);
    EXPECT_EQ(t, 14);

    n = t = h = 0;
    Reply fromZero("\r\n+CPBR: (0-99),20,10\r\n\r\nOK\r\n");
    PhonebookParseGeometry(fromZero.begin(), fromZero.length(), &n, &t, &h);
    EXPECT_EQ(h, 0);
    EXPECT_EQ(n, 20);
    EXPECT_EQ(t, 10);

    n = t = h = -1;
    Reply noText("+CPBR: (1-100),20\r\n");
    PhonebookParseGeometry(noText.begin(), noText.length(), &n, &t, &h);
    EXPECT_EQ(h, 100);
    EXPECT_EQ(n, 20);
    EXPECT_EQ(t, -1);

    n = t = h = -1;
    Reply cut("+CPBR: (1-");  // nothing behind either pattern
    PhonebookParseGeometry(cut.begin(), cut.length(), &n, &t, &h);
    EXPECT_EQ(h, -1);
    EXPECT_EQ(n, -1);
}

}  // namespace
}  // namespace vqm
