#include "support/gsm.h"

#include <gtest/gtest.h>

#include <cstring>
#include <random>
#include <string>
#include <vector>

namespace vqm {
namespace {

TEST(GsmAlphabet, EveryCodeRoundTripsThroughUtf16) {
    int withLatinForm = 0;
    for (int code = 0; code < 128; ++code) {
        if (code == 0x1B) continue;  // the escape has no character
        char16_t ch = GsmCodeToWide(static_cast<uint8_t>(code));
        EXPECT_EQ(WideToGsmCode(ch), code) << "code " << code;
        int latin = GsmCodeToLatin(static_cast<uint8_t>(code));
        if (latin >= 0) {
            ++withLatinForm;
            EXPECT_EQ(latin, ch);
            EXPECT_EQ(LatinToGsmCode(static_cast<uint8_t>(latin)), code);
        }
    }
    // Everything but the escape and the ten Greek capitals has an ISO 8859-1 form.
    EXPECT_EQ(withLatinForm, 117);
}

TEST(GsmAlphabet, CodesThatDifferFromAscii) {
    struct Pair {
        char16_t ch;
        int code;
    };
    const Pair pairs[] = {
        {u'@', 0x00},      {u'\u00A3', 0x01}, {u'$', 0x02},      {u'\u00A5', 0x03},
        {u'\u00E8', 0x04}, {u'\u00C7', 0x09}, {u'\u00C5', 0x0E}, {u'\u0394', 0x10},
        {u'_', 0x11},      {u'\u03A3', 0x18}, {u'\u039E', 0x1A}, {u'\u00C9', 0x1F},
        {u'\u00A4', 0x24}, {u'\u00A1', 0x40}, {u'\u00D1', 0x5D}, {u'\u00A7', 0x5F},
        {u'\u00BF', 0x60}, {u'\u00FC', 0x7E}, {u'\u00E0', 0x7F}};
    for (const Pair& p : pairs) {
        EXPECT_EQ(WideToGsmCode(p.ch), p.code) << static_cast<int>(p.ch);
        EXPECT_EQ(GsmCodeToWide(static_cast<uint8_t>(p.code)), p.ch);
    }
    // ASCII characters the default alphabet lacks, and the extension table's.
    for (char16_t ch : std::u16string(u"[]{}\\^~|`\u20AC\t"))
        EXPECT_EQ(WideToGsmCode(ch), -1) << int(ch);
}

TEST(GsmAlphabet, SevenBitOrUcs2DecidedForTheWholeText) {
    auto decide = [](const std::u16string& s) { return CanUseGsmAlphabet(s.data(), s.size() * 2); };
    EXPECT_TRUE(decide(u"Meet at 10, room 4B."));
    EXPECT_TRUE(decide(u"\u00A35 @ caf\u00E9 \u00BFqu\u00E9? \u00C5ngstr\u00F6m\r\n"));
    EXPECT_TRUE(decide(u""));
    EXPECT_FALSE(decide(u"Meet at 10 [room 4B]."));
    EXPECT_FALSE(decide(u"Price: 5\u20AC"));
    EXPECT_FALSE(decide(u"\u0394 is in the alphabet but not in the 8-bit body"));
    EXPECT_FALSE(decide(u"\u4F60\u597D"));
    EXPECT_TRUE(CanUseGsmAlphabetCounted(u"abc", 6));
    EXPECT_FALSE(CanUseGsmAlphabetCounted(u"ab~", 6));
}

TEST(Septets, KnownPacking) {
    char hex[64];
    EXPECT_EQ(PackSeptets("hellohello", hex, sizeof hex), 18);
    EXPECT_STREQ(hex, "E8329BFD4697D9EC37");
    // Seven and eight characters both fill seven octets.
    EXPECT_EQ(PackSeptets("ABCDEFG", hex, sizeof hex), 14);
    EXPECT_EQ(PackSeptets("ABCDEFGH", hex, sizeof hex), 14);
    EXPECT_EQ(PackSeptets("", hex, sizeof hex), 0);
    EXPECT_STREQ(hex, "");
    // The 8-bit body goes through the alphabet: '@' is code 0, '$' code 2.
    EXPECT_EQ(PackSeptets("@@", hex, sizeof hex), 4);
    EXPECT_STREQ(hex, "0000");
    EXPECT_EQ(PackSeptets("$", hex, sizeof hex), 2);
    EXPECT_STREQ(hex, "02");
}

TEST(Septets, UnpackUsesTheUserDataLengthWhenGiven) {
    char out[32];
    EXPECT_EQ(UnpackSeptets("E8329BFD4697D9EC37", 18, out, sizeof out), 10);
    EXPECT_STREQ(out, "hellohello");
    // Seven characters in seven octets leave room for an eighth septet of zeros.
    char hex[32];
    PackSeptets("ABCDEFG", hex, sizeof hex);
    EXPECT_EQ(UnpackSeptets(hex, 14, out, sizeof out), 8);
    EXPECT_EQ(out[7], '\0');
    EXPECT_EQ(UnpackSeptets(hex, 14, out, sizeof out, 7), 7);
    EXPECT_STREQ(out, "ABCDEFG");
    // '@' comes out as the byte 0.
    EXPECT_EQ(UnpackSeptets("00", 2, out, sizeof out, 1), 1);
    EXPECT_EQ(out[0], '\0');
}

TEST(Septets, EveryCodeAndEveryLengthRoundTrips) {
    std::mt19937 random(2024);
    for (int length = 0; length <= 160; ++length) {
        std::vector<uint8_t> codes(length);
        for (int i = 0; i < length; ++i)
            codes[i] = static_cast<uint8_t>((i * 37 + random()) & 0x7F);
        char hex[400];
        int digits = PackGsmCodes(codes.data(), length, hex, sizeof hex);
        ASSERT_EQ(digits, (length * 7 + 7) / 8 * 2);
        char out[200];
        ASSERT_EQ(UnpackSeptets(hex, digits, out, sizeof out, length), length);
        EXPECT_EQ(std::vector<uint8_t>(out, out + length), codes) << "length " << length;
    }
    std::vector<uint8_t> all(128);
    for (int i = 0; i < 128; ++i)
        all[i] = static_cast<uint8_t>(i);
    char hex[300], out[200];
    int digits = PackGsmCodes(all.data(), 128, hex, sizeof hex);
    ASSERT_EQ(UnpackSeptets(hex, digits, out, sizeof out, 128), 128);
    EXPECT_EQ(std::memcmp(out, all.data(), 128), 0);
}

TEST(Septets, LatinBodyRoundTripsThroughDisplay) {
    const char body[] =
        "\xA3"
        "5 @ caf\xE9 \xBFqu\xE9? $_";
    char hex[64], codes[64], shown[64];
    int digits = PackSeptets(body, hex, sizeof hex);
    int count =
        UnpackSeptets(hex, digits, codes, sizeof codes, static_cast<int>(std::strlen(body)));
    ASSERT_EQ(count, static_cast<int>(std::strlen(body)));
    EXPECT_EQ(GsmToDisplay(codes, count, shown, sizeof shown), count);
    EXPECT_STREQ(shown, body);
}

TEST(Septets, BoundedOutput) {
    char hex[5];
    EXPECT_EQ(PackSeptets("ABC", hex, sizeof hex), 0);  // needs 6 digits and a NUL
    EXPECT_STREQ(hex, "");
    char out[4];
    EXPECT_EQ(UnpackSeptets("E8329BFD4697D9EC37", 18, out, sizeof out), 3);
    EXPECT_STREQ(out, "hel");
    // Garbage stops the unpacking where it starts.
    EXPECT_EQ(UnpackSeptets("E832ZZFD", 8, out, sizeof out), 2);
    // An odd digit at the end is not half an octet.
    EXPECT_EQ(UnpackSeptets("E83", 3, out, sizeof out), 1);
}

TEST(Hex, FieldsOfAPdu) {
    char out[8];
    EXPECT_EQ(IntToHex(10, out, sizeof out, 2), 2);
    EXPECT_STREQ(out, "0A");
    EXPECT_EQ(IntToHex(0xA7, out, sizeof out, 2), 2);
    EXPECT_STREQ(out, "A7");
    EXPECT_EQ(IntToHex(0x1FF, out, sizeof out, 2), 2);
    EXPECT_STREQ(out, "FF");
    EXPECT_EQ(IntToHex(1, out, 2, 2), 0);
    const char field[] = "91a7G0";
    EXPECT_EQ(HexToInt(field, field + 6, 2), 0x91);
    EXPECT_EQ(HexToInt(field + 2, field + 6, 2), 0xA7);
    EXPECT_EQ(HexToInt(field + 4, field + 6, 2), -1);
    EXPECT_EQ(HexToInt(field + 5, field + 6, 2), -1);  // one digit left before the end
}

TEST(Ucs2, HexFormAndBack) {
    const std::u16string text = u"A\u00E9\u20AC\u4F60";
    char hex[64];
    EXPECT_EQ(TextToUcs2Hex(text.data(), text.size() * 2, hex, sizeof hex), 16);
    EXPECT_STREQ(hex, "004100E920AC4F60");
    uint8_t bytes[32];
    int count = HexToBytes(hex, 16, bytes, sizeof bytes);
    ASSERT_EQ(count, 8);
    char16_t wide[16];
    EXPECT_EQ(Ucs2BytesToWide(bytes, count, wide, 16), 4);
    EXPECT_EQ(std::u16string(wide), text);
    // 70 characters are 280 digits; a buffer one short of the NUL refuses.
    std::u16string seventy(70, u'\u0416');
    char big[281];
    EXPECT_EQ(TextToUcs2Hex(seventy.data(), 140, big, sizeof big), 280);
    EXPECT_EQ(TextToUcs2Hex(seventy.data(), 140, big, 280), 0);
}

TEST(Ucs2, BrokenInputIsBounded) {
    uint8_t bytes[2];
    EXPECT_EQ(HexToBytes("00410042", 8, bytes, sizeof bytes), 2);
    EXPECT_EQ(HexToBytes("0G41", 4, bytes, sizeof bytes), 0);
    EXPECT_EQ(HexToBytes("004", 3, bytes, sizeof bytes), 1);
    char16_t wide[4];
    const uint8_t odd[] = {0x00, 0x41, 0x00};
    EXPECT_EQ(Ucs2BytesToWide(odd, 3, wide, 4), 1);
    EXPECT_EQ(Ucs2BytesToWide(odd, 2, wide, 1), 0);
    EXPECT_EQ(wide[0], u'\0');
}

TEST(Display, GsmCodesShownAsText) {
    const char codes[] = {0x00, 0x01, 0x10, 0x1B, 0x41, 0x7F};
    char shown[16];
    EXPECT_EQ(GsmToDisplay(codes, 6, shown, sizeof shown), 6);
    EXPECT_STREQ(shown, "@\xA3? A\xE0");
    char16_t wide[16];
    EXPECT_EQ(GsmToWide(codes, 6, wide, 16), 6);
    EXPECT_EQ(std::u16string(wide), u"@\u00A3\u0394 A\u00E0");
    char gsm[8];
    EXPECT_EQ(TextToGsm("@$[a", 4, gsm, sizeof gsm), 4);
    EXPECT_EQ(std::string(gsm, 4), std::string("\x00\x02?a", 4));
}

TEST(Counter, LineBreaksCountOnce) {
    char16_t counted[200];
    EXPECT_EQ(CountForLimit(u"ab\r\ncd", 6, counted, 200), 5);
    EXPECT_EQ(std::u16string(counted), u"ab\ncd");
    EXPECT_EQ(CountForLimit(u"a\rb\n", 4, counted, 200), 4);
    std::u16string full(160, u'x');
    EXPECT_EQ(CountForLimit(full.data(), 160, counted, 200), 160);
    EXPECT_EQ(CountForLimit(full.data(), 160, counted, 10), 9);
}

TEST(PhoneNumber, WhatPeopleType) {
    for (const char16_t* ok : {u"+44 (20) 1234 5678", u"+44+2012345678", u"*#06#", u"112",
                               u"0800-123-456", u"12345678901234567890"}) {
        EXPECT_TRUE(IsValidPhoneNumber(ok))
            << std::string(ok, ok + std::char_traits<char16_t>::length(ok));
    }
    for (const char16_t* bad :
         {u"", u"+", u"  ", u"Ann", u"12a4", u"12.34", u"123456789012345678901", u"+44\u0660"}) {
        EXPECT_FALSE(IsValidPhoneNumber(bad))
            << std::string(bad, bad + std::char_traits<char16_t>::length(bad));
    }
    std::u16string longText(70, u' ');
    longText += u"1";
    EXPECT_FALSE(IsValidPhoneNumber(longText.c_str()));
}

}  // namespace
}  // namespace vqm
