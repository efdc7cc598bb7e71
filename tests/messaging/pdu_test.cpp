// The message codec without a card: the semi-octet swap, the submit PDU, and the two read
// parsers on hand-built replies, including truncated and lying ones.
#include <gtest/gtest.h>

#include <cstring>
#include <string>
#include <vector>

#include "messaging/sms_at.h"
#include "messaging/sms_folder.h"
#include "support/gsm.h"

namespace vqm {
namespace {

// The parser sees exactly the reply's bytes, in a buffer of that size and no NUL, so that a
// read past its end is a fault the address sanitizer reports.
int ParsePdu(const std::string& reply, SmsRecord* record) {
    std::vector<char> exact(reply.begin(), reply.end());
    return SmsParsePduReply(exact.data(), static_cast<int>(exact.size()), record);
}

std::string Reply(int stat, const std::string& pdu) {
    const int octets = static_cast<int>(pdu.size() / 2) - 1;
    return "\r\n+CMGR: " + std::to_string(stat) + ",," + std::to_string(octets) + "\r\n" + pdu +
           "\r\n\r\nOK\r\n";
}

constexpr char kCentre[] = "0691037901000";  // +3097100000, completed below with its last digit

TEST(SemiOctets, SwapPadAndBound) {
    char out[40];
    EXPECT_EQ(PhoneToSemiOctets("+4412", out, sizeof out), 4);
    EXPECT_STREQ(out, "4421");
    EXPECT_EQ(PhoneToSemiOctets("12345", out, sizeof out), 5);
    EXPECT_STREQ(out, "2143F5");
    // Reading undoes the swap; the pad is then the last character.
    EXPECT_EQ(PhoneToSemiOctets("2143F5", out, sizeof out), 6);
    EXPECT_STREQ(out, "12345F");
    // At most 32 characters are taken, however long the text.
    EXPECT_EQ(PhoneToSemiOctets("+12345678901234567890123456789012345", out, sizeof out), 32);
    EXPECT_EQ(std::strlen(out), 32u);
    // A small buffer gets what fits, still padded and terminated.
    char small[5];
    EXPECT_EQ(PhoneToSemiOctets("1234567", small, sizeof small), 4);
    EXPECT_STREQ(small, "2143");
    EXPECT_EQ(PhoneToSemiOctets("123", small, sizeof small), 3);
    EXPECT_STREQ(small, "21F3");
    EXPECT_EQ(PhoneToSemiOctets("", out, sizeof out), 0);
    EXPECT_STREQ(out, "");
}

SmsRecord Record(const char* number, int coding, const char* text, int length) {
    SmsRecord record{};
    std::snprintf(record.number, sizeof record.number, "%s", number);
    std::snprintf(record.text, sizeof record.text, "%s", text);
    record.coding = coding;
    record.length = length;
    return record;
}

TEST(SubmitPdu, FieldsAndTheLengthForTheCommand) {
    char pdu[kSmsPduCommandSize];
    // An empty body still carries its user-data length; 10 octets for 4 digits.
    EXPECT_EQ(BuildSubmitPdu(Record("+4412", 0, "", 0), pdu, sizeof pdu), 10);
    EXPECT_STREQ(pdu,
                 "00110004914421"
                 "0000A7"
                 "00");
    EXPECT_EQ(BuildSubmitPdu(Record("12345", 0, "hello", 5), pdu, sizeof pdu), 16);
    EXPECT_STREQ(pdu,
                 "0011000581"
                 "2143F5"
                 "0000A7"
                 "05"
                 "E8329BFD06");
    // UCS2 goes as it stands, with half the hexadecimal digits as its octet count.
    EXPECT_EQ(BuildSubmitPdu(Record("+306944123456", 8, "03A9004F", 8), pdu, sizeof pdu), 18);
    EXPECT_STREQ(pdu,
                 "001100"
                 "0C91039644214365"
                 "0008A7"
                 "04"
                 "03A9004F");
    // Whatever the coding asks for besides UCS2 is sent as 7-bit.
    EXPECT_EQ(BuildSubmitPdu(Record("1", 0xF2, "Hi", 2), pdu, sizeof pdu), 11);
    EXPECT_STREQ(pdu,
                 "0011000181"
                 "F1"
                 "0000A7"
                 "02"
                 "C834");
}

TEST(SubmitPdu, RefusesWhatDoesNotFit) {
    char pdu[kSmsPduCommandSize];
    EXPECT_EQ(BuildSubmitPdu(Record("12345", 0, "hello", 5), pdu, 20), 0);
    EXPECT_STREQ(pdu, "");
    // A body filling the whole record, with no NUL, packs to more than a command holds.
    SmsRecord full = Record("12345", 0, "", 640);
    std::memset(full.text, 'a', sizeof full.text);
    EXPECT_EQ(BuildSubmitPdu(full, pdu, sizeof pdu), 0);
    std::vector<char> big(2000);
    EXPECT_EQ(BuildSubmitPdu(full, big.data(), big.size()), (24 + 1120) / 2 - 1);
    // A number filling its field without a NUL is read no further than the field.
    SmsRecord longNumber = Record("", 0, "", 0);
    std::memset(longNumber.number, '7', sizeof longNumber.number);
    EXPECT_EQ(BuildSubmitPdu(longNumber, pdu, sizeof pdu), 18);
    EXPECT_EQ(std::string(pdu).substr(6, 4), "1481");
}

struct ReadCase {
    const char* name;
    std::string reply;
    int result;
    const char* number;
    const char* status;
    const char* date;
    int coding;
    std::string text;
};

std::vector<ReadCase> ReadCases() {
    const std::string centre = std::string(kCentre) + "0";
    const std::string stamp = "20301141526300";  // 02/03/11 14:25:36
    return {
        {"deliver with centre, international",
         Reply(1, centre +
                      "04"
                      "0C91039644214365"
                      "0000" +
                      stamp + "05E8329BFD06"),
         1, "+306944123456", "REC READ", "14:25:36,11/03/2002", 0, "hello"},
        {"deliver without centre, national, odd digit count",
         Reply(0,
               "00"
               "04"
               "0581"
               "2143F5"
               "0000" +
                   stamp + "05E8329BFD06"),
         1, "12345", "REC UNREAD", "14:25:36,11/03/2002", 0, "hello"},
        {"stored submit keeps no date",
         Reply(2,
               "00"
               "11"
               "00"
               "0581"
               "2143F5"
               "0000A7"
               "05E8329BFD06"),
         1, "12345", "STO UNSENT", "", 0, "hello"},
        {"status report layout skips its reference too",
         Reply(1,
               "00"
               "06"
               "2A"
               "0491"
               "4421"
               "0000" +
                   stamp + "02C834"),
         1, "+4412", "REC READ", "14:25:36,11/03/2002", 0, "Hi"},
        {"seven characters in seven octets are seven",
         Reply(1,
               "00"
               "04"
               "0491"
               "4421"
               "0000" +
                   stamp + "0731D98C56B3DD00"),
         1, "+4412", "REC READ", "14:25:36,11/03/2002", 0, "1234567"},
        {"three codes are shown as space, dollar and bracket",
         Reply(1,
               "00"
               "04"
               "0491"
               "4421"
               "0000" +
                   stamp + "0480A0C001"),
         1, "+4412", "REC READ", "14:25:36,11/03/2002", 0, " A$]"},
        {"0xF2 is 7-bit as well",
         Reply(1,
               "00"
               "04"
               "0491"
               "4421"
               "00F2" +
                   stamp + "02C834"),
         1, "+4412", "REC READ", "14:25:36,11/03/2002", 0xF2, "Hi"},
        {"UCS2 stays hexadecimal",
         Reply(0,
               "00"
               "04"
               "0491"
               "4421"
               "0008" +
                   stamp + "0403A9004F"),
         1, "+4412", "REC UNREAD", "14:25:36,11/03/2002", 8, "03A9004F"},
        {"8-bit data",
         Reply(1,
               "00"
               "04"
               "0491"
               "4421"
               "0004" +
                   stamp + "03010203"),
         1, "+4412", "REC READ", "14:25:36,11/03/2002", 4, "DATA MESSAGE"},
        {"a stored sent message has no status word",
         Reply(3,
               "00"
               "04"
               "0491"
               "4421"
               "0000" +
                   stamp + "02C834"),
         1, "+4412", "", "14:25:36,11/03/2002", 0, "Hi"},
        {"empty body",
         Reply(1,
               "00"
               "04"
               "0491"
               "4421"
               "0000" +
                   stamp + "00"),
         1, "+4412", "REC READ", "14:25:36,11/03/2002", 0, ""},
        {"a half octet short of the user-data length is rejected",
         Reply(1,
               "00"
               "04"
               "0491"
               "4421"
               "0000" +
                   stamp + "05E8329BFD0"),
         0, "+4412", "REC READ", "14:25:36,11/03/2002", 0, ""},
        {"a user-data length beyond the data is rejected",
         Reply(1,
               "00"
               "04"
               "0491"
               "4421"
               "0000" +
                   stamp + "A0C834"),
         0, "+4412", "REC READ", "14:25:36,11/03/2002", 0, ""},
        {"11 septets announced, 10 present",
         "\r\n+CMGR: 1,,36\r\n07912143658709F1040B918100551512F20000111010214365000BE8329BFD4697"
         "D9EC37\r\n\r\nOK\r\n",
         0, "+18005551212", "REC READ", "12:34:56,01/01/2011", 0, ""},
        {"user data behind a concatenation header",
         Reply(1,
               "00"
               "44"
               "0491"
               "4421"
               "0000" +
                   stamp + "09050003A70201" "9069"),
         1, "+4412", "REC READ", "14:25:36,11/03/2002", 0, "Hi"},
        {"UCS2 behind a 16-bit concatenation header",
         Reply(1,
               "00"
               "44"
               "0491"
               "4421"
               "0008" +
                   stamp + "0906080401F40302" "0041"),
         1, "+4412", "REC READ", "14:25:36,11/03/2002", 8, "0041"},
        // A stored message's validity period in each format its first octet can name.
        {"stored, no validity period", Reply(2, "00" "01" "00" "0491" "4421" "0000" "02C834"), 1,
         "+4412", "STO UNSENT", "", 0, "Hi"},
        {"stored, relative validity period",
         Reply(2, "00" "11" "00" "0491" "4421" "0000" "A7" "02C834"), 1, "+4412", "STO UNSENT",
         "", 0, "Hi"},
        {"stored, enhanced validity period",
         Reply(2, "00" "09" "00" "0491" "4421" "0000" "01000000000000" "02C834"), 1, "+4412",
         "STO UNSENT", "", 0, "Hi"},
        {"stored, absolute validity period",
         Reply(2, "00" "19" "00" "0491" "4421" "0000" "20301141526300" "02C834"), 1, "+4412",
         "STO UNSENT", "", 0, "Hi"},
        {"an alphanumeric sender spells its name",
         Reply(1,
               "00"
               "04"
               "07D0"
               "C2B07B0D"
               "0000" +
                   stamp + "02C834"),
         1, "Bank", "REC READ", "14:25:36,11/03/2002", 0, "Hi"},
        // Failures: the fields read before the failure stay.
        {"no +CMGR: line", "\r\n+CMS ERROR: 321\r\n", 0, "", "", "", 0, ""},
        {"a named alpha field is not read", "\r\n+CMGR: 1,\"Ann\",20\r\n0004\r\n", 0, "",
         "REC READ", "", 0, ""},
        {"header without a PDU", "\r\n+CMGR: 1,,20", 0, "", "REC READ", "", 0, ""},
        {"centre length beyond the PDU", Reply(1, "FF04"), 0, "", "REC READ", "", 0, ""},
        {"address longer than what follows",
         Reply(1,
               "0004"
               "1491"
               "4421"),
         0, "", "REC READ", "", 0, ""},
        {"time stamp cut short",
         Reply(1,
               "00"
               "04"
               "0491"
               "4421"
               "0000"
               "203011"),
         0, "+4412", "REC READ", "", 0, ""},
        {"user-data length missing",
         Reply(1,
               "00"
               "04"
               "0491"
               "4421"
               "0000" +
                   stamp),
         0, "+4412", "REC READ", "14:25:36,11/03/2002", 0, ""},
        {"not hexadecimal",
         Reply(1,
               "0004"
               "04ZZ4421"),
         0, "", "REC READ", "", 0, ""},
    };
}

TEST(ReadPdu, HandBuiltReplies) {
    for (const ReadCase& c : ReadCases()) {
        SCOPED_TRACE(c.name);
        SmsRecord record{};
        ASSERT_EQ(ParsePdu(c.reply, &record), c.result);
        EXPECT_STREQ(record.number, c.number);
        EXPECT_STREQ(record.status, c.status);
        EXPECT_STREQ(record.date, c.date);
        if (c.result == 1) {
            EXPECT_EQ(record.coding, c.coding);
            EXPECT_EQ(std::string(record.text, record.length), c.text);
            EXPECT_EQ(record.text[record.length], '\0');
        }
    }
}

TEST(ReadPdu, EveryCodeOfTheAlphabetShowsAsItselfButTheThreeTheReadReplaces) {
    std::vector<uint8_t> codes;
    for (int code = 0; code < 128; ++code)
        codes.push_back(static_cast<uint8_t>(code));
    char packed[400];
    ASSERT_GT(PackGsmCodes(codes.data(), static_cast<int>(codes.size()), packed, sizeof packed), 0);
    SmsRecord record{};
    ASSERT_EQ(ParsePdu(Reply(1, std::string("00" "04" "0491" "4421" "0000" "20301141526300") +
                                    "80" + packed),
                       &record),
              1);
    ASSERT_EQ(record.length, 128);
    const std::u16string pane = MessageBodyText(record);
    const std::u16string preview = MessagePreviewText(record);
    ASSERT_EQ(pane.size(), 128u);
    ASSERT_EQ(preview.size(), 128u);
    for (int code = 0; code < 128; ++code) {
        // '@', '$' and 'Å' are shown as the read replaces them; the escape, which has no
        // character of its own, as a blank; every other code as the alphabet's character.
        char16_t expected = GsmCodeToWide(static_cast<uint8_t>(code));
        if (code == 0x00 || code == 0x1B) expected = u' ';
        if (code == 0x02) expected = u'$';
        if (code == 0x0E) expected = u']';
        EXPECT_EQ(pane[code], expected) << "code " << code;
        const char16_t onOneLine = expected == u'\n' || expected == u'\r' ? u' ' : expected;
        EXPECT_EQ(preview[code], onOneLine) << "code " << code;
    }
    EXPECT_EQ(pane[0x24], u'\u00A4');  // the currency sign stays itself
    EXPECT_EQ(pane[0x5D], u'\u00D1');
}

TEST(ReadPdu, ConcatenationHeaderMarksThePart) {
    const std::string stamp = "20301141526300";
    struct Case {
        std::string userData;
        SmsPartInfo part;
    };
    const Case cases[] = {
        {"09050003A70201" "9069", {0xA7, 2, 1}},
        {"0906080401F40302" "0041", {0x1F4, 3, 2}},
    };
    for (const Case& c : cases) {
        SmsRecord record{};
        const bool wide = c.part.reference > 0xFF;
        ASSERT_EQ(ParsePdu(Reply(1, std::string("00" "44" "0491" "4421" "00") +
                                        (wide ? "08" : "00") + stamp + c.userData),
                           &record),
                  1);
        SmsPartInfo part{};
        ASSERT_TRUE(SmsPartOf(record, &part));
        EXPECT_EQ(part.reference, c.part.reference);
        EXPECT_EQ(part.total, c.part.total);
        EXPECT_EQ(part.sequence, c.part.sequence);
    }
    // A header without a concatenation element (a port number) marks nothing.
    SmsRecord ported{};
    ASSERT_EQ(
        ParsePdu(Reply(1, "00" "44" "0491" "4421" "0000" + stamp + "0A" "060504" "0B8423F0" "C834"),
                 &ported),
        1);
    EXPECT_STREQ(ported.text, "Hi");
    SmsPartInfo part{};
    EXPECT_FALSE(SmsPartOf(ported, &part));
}

TEST(ReadPdu, StaysInsideTheRecordOnOversizedFields) {
    // Twenty international digits: the field keeps "+" and 18 of them and its NUL.
    SmsRecord record{};
    ASSERT_EQ(ParsePdu(Reply(1,
                             "00"
                             "04"
                             "1491"
                             "21436587092143658709"
                             "0000"
                             "20301141526300"
                             "02C834"),
                       &record),
              1);
    EXPECT_STREQ(record.number, "+123456789012345678");
    EXPECT_STREQ(record.text, "Hi");
    // UCS2 data longer than the text field is cut to it, terminated.
    SmsRecord wide{};
    const std::string data(700, 'A');
    ASSERT_EQ(ParsePdu(Reply(1,
                             "00"
                             "04"
                             "0491"
                             "4421"
                             "0008"
                             "20301141526300"
                             "8C" +
                                 data),
                       &wide),
              1);
    // Only the 140 octets the user-data length announces are the body.
    EXPECT_EQ(wide.length, 280);
    EXPECT_EQ(wide.text[280], '\0');
    // The number is appended to what the record holds, never past its field.
    SmsRecord dirty{};
    std::memset(dirty.number, '9', sizeof dirty.number);
    ASSERT_EQ(ParsePdu(Reply(1,
                             "00"
                             "04"
                             "0491"
                             "4421"
                             "0000"
                             "20301141526300"
                             "02C834"),
                       &dirty),
              1);
    EXPECT_EQ(std::string(dirty.number, sizeof dirty.number), std::string(20, '9'));
}

TEST(ReadPdu, EveryPrefixOfAGoodReplyIsSafe) {
    const std::string good = Reply(1, std::string(kCentre) +
                                          "0"
                                          "04"
                                          "0C91039644214365"
                                          "0000"
                                          "20301141526300"
                                          "05E8329BFD06");
    for (size_t cut = 0; cut < good.size(); ++cut) {
        SmsRecord record{};
        const int result = ParsePdu(good.substr(0, cut), &record);
        EXPECT_LT(std::strlen(record.text), sizeof record.text);
        // Until the user data are reached a cut reply cannot be a message.
        if (cut < good.find("05E8329BFD06")) {
            EXPECT_EQ(result, 0) << "cut at " << cut;
        }
    }
}

TEST(ReadText, HeaderFieldsDateAndBody) {
    const std::string reply =
        "\r\n+CMGR: \"REC READ\",\"+306944123456\",,\"02/03/11,14:25:36+08\"\r\nSee you at "
        "noon\r\n\r\nOK\r\n";
    SmsRecord record{};
    ASSERT_EQ(SmsParseTextReply(reply.data(), static_cast<int>(reply.size()), &record), 1);
    EXPECT_STREQ(record.status, "REC READ");
    EXPECT_STREQ(record.number, "+306944123456");
    EXPECT_STREQ(record.date, "14:25:36,11/03/2002");
    EXPECT_EQ(std::string(record.text, 16), "See you at noon\r");
    EXPECT_EQ(record.coding, 0);

    // A stored message has no date; its body follows the header's line end.
    const std::string stored = "\r\n+CMGR: \"STO UNSENT\",\"12345\",\r\nDraft\r\n\r\nOK\r\n";
    SmsRecord draft{};
    ASSERT_EQ(SmsParseTextReply(stored.data(), static_cast<int>(stored.size()), &draft), 1);
    EXPECT_STREQ(draft.date, "");
    EXPECT_EQ(std::string(draft.text, 5), "Draft");

    for (const std::string& bad : {
             std::string("\r\n+CMGR: \"REC READ\" \"+30\",,\"x\"\r\nA\r\n\r\nOK\r\n"),
             std::string("\r\n+CMGR: \"REC READ\",\"+30\"\r\nA\r\n\r\nOK\r\n"),
             std::string("\r\n+CMGR: \"REC READ\",\"+30\",,\"02/03/11,14:25:36+08\"\r\nA"),
             std::string("\r\n+CMGR: \"REC READ\",\"+30"),
         }) {
        SmsRecord record{};
        EXPECT_EQ(SmsParseTextReply(bad.data(), static_cast<int>(bad.size()), &record), 0) << bad;
    }
}

}  // namespace
}  // namespace vqm
