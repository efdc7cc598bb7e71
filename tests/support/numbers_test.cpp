#include "support/numbers.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <cstring>
#include <string>
#include <vector>

namespace vqm {
namespace {

int Dates(int direction, const std::string& a, const std::string& b) {
    return CompareDateTime(direction, a.data(), static_cast<int>(a.size()), b.data(),
                           static_cast<int>(b.size()));
}

TEST(CompareDateTime, OrdersByRealDateNotByText) {
    // As text, the first would sort after the second; by date it is a year older.
    EXPECT_LT(Dates(0, "23:59:59,31/12/2025", "00:00:00,01/01/2026"), 0);
    EXPECT_LT(Dates(0, "10:00:00,02/03/2026", "09:00:00,01/04/2026"), 0);
    EXPECT_LT(Dates(0, "09:00:00,05/04/2026", "10:00:00,05/04/2026"), 0);
    EXPECT_LT(Dates(0, "10:00:00,05/04/2026", "10:00:01,05/04/2026"), 0);
    EXPECT_EQ(Dates(0, "10:00:00,05/04/2026", "10:00:00,05/04/2026"), 0);
    EXPECT_GT(Dates(1, "23:59:59,31/12/2025", "00:00:00,01/01/2026"), 0);
}

TEST(CompareDateTime, NewestFirstWithDirectionOne) {
    std::vector<std::string> log = {"08:15:00,14/02/2026", "21:40:12,03/11/2025",
                                    "08:15:00,14/02/2025", "07:00:00,15/02/2026",
                                    "not a date",          "19:05:33,14/02/2026"};
    auto sorted = [&](int direction) {
        std::vector<std::string> items = log;
        std::stable_sort(
            items.begin(), items.end(),
            [&](const std::string& a, const std::string& b) { return Dates(direction, a, b) < 0; });
        return items;
    };
    EXPECT_EQ(sorted(1), (std::vector<std::string>{"07:00:00,15/02/2026", "19:05:33,14/02/2026",
                                                   "08:15:00,14/02/2026", "21:40:12,03/11/2025",
                                                   "08:15:00,14/02/2025", "not a date"}));
    EXPECT_EQ(sorted(0), (std::vector<std::string>{"08:15:00,14/02/2025", "21:40:12,03/11/2025",
                                                   "08:15:00,14/02/2026", "19:05:33,14/02/2026",
                                                   "07:00:00,15/02/2026", "not a date"}));
}

TEST(CompareDateTime, ReadsOnlyWhatItIsGiven) {
    // The list hands over at most 32 characters; a text cut short is not a date.
    const char full[] = "10:00:00,05/04/2026";
    EXPECT_GT(CompareDateTime(0, full, 10, full, 19), 0);
    // A NUL inside the given length ends the text.
    const char padded[32] = "10:00:00,05/04/2026";
    EXPECT_EQ(CompareDateTime(0, padded, 32, full, 19), 0);
    EXPECT_GT(Dates(0, "10:00:00,32/04/2026", "10:00:00,05/04/2026"), 0);
}

TEST(CompareText, IgnoresCaseAndFlipsWithDirection) {
    auto text = [](int direction, const char* a, const char* b) {
        return CompareText(direction, a, static_cast<int>(std::strlen(a)), b,
                           static_cast<int>(std::strlen(b)));
    };
    EXPECT_LT(text(0, "anna", "Bob"), 0);
    EXPECT_GT(text(1, "anna", "Bob"), 0);
    EXPECT_LT(text(0, "Ann", "Anna"), 0);
    EXPECT_NE(text(0, "ann", "Ann"), 0);  // still a strict order for equal-looking names
    EXPECT_EQ(text(0, "+4420", "+4420"), 0);
    EXPECT_LT(text(0, "", "a"), 0);
}

TEST(EnglishText, BothFormsAcceptSevenBitPrintable) {
    const char name[] = "Ann O'Neil (work) #2";
    EXPECT_TRUE(IsEnglishText(name, std::strlen(name)));
    const std::u16string wide = u"Ann O'Neil (work) #2";
    EXPECT_TRUE(IsEnglishText(wide.data(), wide.size() * 2));

    EXPECT_FALSE(IsEnglishText("Jos\xE9", 4));
    const std::u16string accented = u"Jos\u00E9";
    EXPECT_FALSE(IsEnglishText(accented.data(), accented.size() * 2));
    // Both bytes of U+4141 look like 'A' one at a time; as a character it is not English.
    const std::u16string cjk = u"\u4141";
    EXPECT_FALSE(IsEnglishText(cjk.data(), 2));
    EXPECT_FALSE(IsEnglishText("tab\there", 8));
    EXPECT_TRUE(IsEnglishText("", 0));
}

TEST(NumberText, KeepsTheDialableCharacters) {
    char16_t out[256];
    EXPECT_EQ(CopyNumberText(u"+1 (425) 555-0100", out, 256), 12);
    EXPECT_EQ(std::u16string(out), u"+14255550100");
    EXPECT_EQ(CopyNumberText(u"0044+20.7946*0000#", out, 256), 16);
    EXPECT_EQ(std::u16string(out), u"0044207946*0000#");
    EXPECT_EQ(CopyNumberText(u"ext. only", out, 256), 0);
    EXPECT_EQ(CopyNumberText(u"123456", out, 4), 3);
    EXPECT_EQ(std::u16string(out), u"123");
}

TEST(NumberText, MatchAndConversions) {
    EXPECT_TRUE(NumbersMatch("+441234", "+441234", 7));
    EXPECT_FALSE(NumbersMatch("+441234", "+441235", 7));
    EXPECT_FALSE(NumbersMatch("", "", 0));

    // A record's name field with no terminator stops at the field's size.
    const char field[4] = {'A', 'n', 'n', 'a'};
    char16_t wide[16];
    EXPECT_EQ(NarrowToWideZ(field, sizeof field, wide, 16), 4);
    EXPECT_EQ(std::u16string(wide), u"Anna");
    EXPECT_EQ(NarrowToWideZ("Bo\0b", 4, wide, 16), 2);
    EXPECT_EQ(NarrowToWideZ("\xC5sa", 8, wide, 3), 2);
    EXPECT_EQ(std::u16string(wide), u"\u00C5s");

    std::u16string longName(200, u'n');
    char name[128];
    EXPECT_EQ(WideToNarrowBounded(longName.c_str(), name, sizeof name), 127);
    EXPECT_EQ(name[127], '\0');
    EXPECT_EQ(WideToNarrowBounded(u"\u00C5\u0394", name, sizeof name), 2);
    EXPECT_STREQ(name, "\xC5?");
}

}  // namespace
}  // namespace vqm
