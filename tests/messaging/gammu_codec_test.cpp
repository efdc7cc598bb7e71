// Our PDU codec against gammu's, on a few thousand generated messages: what we build must
// decode in gammu to the same number and text, and what gammu builds must read back through
// our parser unchanged. The sequence of messages is fixed, so a failure repeats.
#include <gammu.h>
#include <gtest/gtest.h>

#include <cstring>
#include <random>
#include <string>
#include <vector>

#include "messaging/sms_at.h"
#include "support/gsm.h"
#include "support/text.h"

namespace vqm {
namespace {

constexpr int kMessages = 2400;

struct Generated {
    std::string number;  // "+" then digits, or digits alone
    bool ucs2 = false;
    std::vector<uint8_t> codes;  // 7-bit: GSM codes
    std::u16string text;         // the body as UTF-16
};

// Codes of the default alphabet that a record's 8-bit text can carry: everything but the
// escape and the Greek capitals, which have no ISO 8859-1 form.
std::vector<uint8_t> LatinCodes() {
    std::vector<uint8_t> codes;
    for (int code = 0; code < 128; ++code)
        if (code != 0x1B && GsmCodeToLatin(static_cast<uint8_t>(code)) >= 0)
            codes.push_back(static_cast<uint8_t>(code));
    return codes;
}

std::vector<uint8_t> AllCodes() {
    std::vector<uint8_t> codes;
    for (int code = 0; code < 128; ++code)
        if (code != 0x1B) codes.push_back(static_cast<uint8_t>(code));
    return codes;
}

class Generator {
  public:
    explicit Generator(std::vector<uint8_t> alphabet) : alphabet_(std::move(alphabet)) {}

    Generated Next(int i) {
        Generated m;
        const bool international = i % 2 == 0;
        // Odd and even lengths, 1 to 18 digits so that "+" and the NUL still fit the record.
        const int digits = 1 + static_cast<int>(Pick(18));
        m.number = international ? "+" : "";
        for (int d = 0; d < digits; ++d)
            m.number.push_back(static_cast<char>('0' + Pick(10)));
        // gammu turns a national number opening with the "00" access code into the "+" form
        // when it encodes; type 0x81 with the digits as typed is what 23.040 carries, so such
        // numbers are left out rather than compared against gammu's rewriting.
        if (!international && m.number.compare(0, 2, "00") == 0) m.number[1] = '1';
        m.ucs2 = i % 3 == 2;
        const int shape = i % 11;  // some empty, some at the limit, the rest anywhere between
        if (m.ucs2) {
            const int count = shape == 0 ? 0 : shape == 1 ? 70 : static_cast<int>(Pick(71));
            for (int c = 0; c < count; ++c) {
                char16_t unit;
                do {
                    unit = static_cast<char16_t>(1 + Pick(0xFFFD));
                    // No halves of surrogate pairs; and no '~', which gammu writes as U+0001 in
                    // UCS2 user data, where 23.038 carries every code unit unchanged.
                } while ((unit >= 0xD800 && unit <= 0xDFFF) || unit == u'~');
                m.text.push_back(unit);
            }
        } else {
            const int count = shape == 0 ? 0 : shape == 1 ? 160 : static_cast<int>(Pick(161));
            for (int c = 0; c < count; ++c) {
                // The first messages walk the whole alphabet in order, the rest pick freely.
                const uint8_t code = walked_ < alphabet_.size() ? alphabet_[walked_++]
                                                                : alphabet_[Pick(alphabet_.size())];
                m.codes.push_back(code);
                m.text.push_back(GsmCodeToWide(code));
            }
        }
        return m;
    }

  private:
    unsigned Pick(size_t n) { return static_cast<unsigned>(engine_() % n); }
    std::mt19937 engine_{20020311u};
    std::vector<uint8_t> alphabet_;
    size_t walked_ = 0;
};

// gammu's text form: big-endian UTF-16 code units ending with a zero unit.
std::u16string FromGammu(const unsigned char* text) {
    std::u16string out;
    for (size_t i = 0; text[i] || text[i + 1]; i += 2)
        out.push_back(static_cast<char16_t>(text[i] << 8 | text[i + 1]));
    return out;
}

void ToGammu(const std::u16string& text, unsigned char* out) {
    size_t i = 0;
    for (char16_t unit : text) {
        out[i++] = static_cast<unsigned char>(unit >> 8);
        out[i++] = static_cast<unsigned char>(unit & 0xFF);
    }
    out[i] = out[i + 1] = 0;
}

// ISO 8859-1 bytes as UTF-16.
std::u16string Widen(const std::string& text) {
    std::u16string wide;
    for (char c : text)
        wide.push_back(static_cast<unsigned char>(c));
    return wide;
}

SmsRecord ToRecord(const Generated& m) {
    SmsRecord record{};
    std::snprintf(record.number, sizeof record.number, "%s", m.number.c_str());
    if (m.ucs2) {
        record.coding = 8;
        record.length =
            TextToUcs2Hex(m.text.data(), m.text.size() * 2, record.text, sizeof record.text);
    } else {
        for (size_t i = 0; i < m.codes.size(); ++i)
            record.text[i] = static_cast<char>(GsmCodeToLatin(m.codes[i]));
        record.length = static_cast<int32_t>(m.codes.size());
    }
    return record;
}

// gammu keeps an encoded message as fields at the offsets its layout names; the PDU on the
// line is those fields in the order of TS 23.040.
std::string WirePdu(const unsigned char* frame, const GSM_SMSMessageLayout& layout, bool submit) {
    std::vector<unsigned char> pdu;
    auto take = [&](size_t at, size_t count) {
        pdu.insert(pdu.end(), frame + at, frame + at + count);
    };
    take(layout.SMSCNumber, 1 + frame[layout.SMSCNumber]);
    const unsigned char firstOctet = frame[layout.firstbyte];
    take(layout.firstbyte, 1);
    if (submit) take(layout.TPMR, 1);
    take(layout.Number, 2 + (frame[layout.Number] + 1) / 2);
    take(layout.TPPID, 1);
    take(layout.TPDCS, 1);
    if (submit && ((firstOctet >> 3) & 3) == 2) take(layout.TPVP, 1);
    if (!submit) take(layout.DateTime, 7);
    const int userDataLength = frame[layout.TPUDL];
    take(layout.TPUDL, 1);
    const bool septets = frame[layout.TPDCS] == 0;
    take(layout.Text, septets ? (userDataLength * 7 + 7) / 8 : userDataLength);
    std::string hex(pdu.size() * 2 + 1, '\0');
    EncodeHexBin(hex.data(), pdu.data(), pdu.size());
    hex.resize(pdu.size() * 2);
    return hex;
}

std::string GammuEncode(const Generated& m, bool submit, const char* centre) {
    GSM_SMSMessage sms;
    GSM_SetDefaultSMSData(&sms);
    sms.PDU = submit ? SMS_Submit : SMS_Deliver;
    sms.Coding = m.ucs2 ? SMS_Coding_Unicode_No_Compression : SMS_Coding_Default_No_Compression;
    sms.Class = -1;
    sms.UDH.Type = UDH_NoUDH;
    ToGammu(Widen(m.number), sms.Number);
    ToGammu(Widen(centre), sms.SMSC.Number);
    sms.SMSC.Validity.Format = SMS_Validity_RelativeFormat;
    sms.SMSC.Validity.Relative = SMS_VALID_1_Day;
    ToGammu(m.text, sms.Text);
    sms.Length = static_cast<int>(m.text.size());
    sms.DateTime = GSM_DateTime{0, 36, 25, 14, 11, 3, 2002};
    unsigned char frame[1024] = {};
    int length = 0;
    const GSM_SMSMessageLayout layout = submit ? PHONE_SMSSubmit : PHONE_SMSDeliver;
    if (GSM_EncodeSMSFrame(GSM_GetGlobalDebug(), &sms, frame, layout, &length, TRUE) != ERR_NONE)
        return {};
    return WirePdu(frame, layout, submit);
}

// What our read makes of a 7-bit body: ISO 8859-1, three codes shown differently.
std::string ShownCodes(const std::vector<uint8_t>& codes) {
    std::string shown;
    for (uint8_t code : codes)
        shown.push_back(SmsCodeToText(code));
    return shown;
}

TEST(GammuCodec, OurSubmitPdusDecodeInGammu) {
    Generator generator(LatinCodes());
    for (int i = 0; i < kMessages; ++i) {
        const Generated m = generator.Next(i);
        SCOPED_TRACE("message " + std::to_string(i) + " to " + m.number);
        const SmsRecord record = ToRecord(m);
        char pdu[kSmsPduCommandSize];
        const int octets = BuildSubmitPdu(record, pdu, sizeof pdu);
        ASSERT_GT(octets, 0);
        // DecodeHexBin writes a NUL behind the bytes and gammu's septet unpacking reads one
        // octet past the user data, so both get room beyond the PDU.
        const size_t count = std::strlen(pdu) / 2;
        std::vector<unsigned char> bytes(count + 8, 0);
        ASSERT_TRUE(DecodeHexBin(bytes.data(), reinterpret_cast<const unsigned char*>(pdu),
                                 std::strlen(pdu)));
        ASSERT_EQ(static_cast<int>(count) - 1, octets);

        GSM_SMSMessage sms;
        GSM_SetDefaultSMSData(&sms);
        size_t end = 0;
        ASSERT_EQ(GSM_DecodePDUFrame(GSM_GetGlobalDebug(), &sms, bytes.data(), count, &end, TRUE),
                  ERR_NONE);
        EXPECT_EQ(sms.PDU, SMS_Submit);
        EXPECT_EQ(end, count);
        EXPECT_EQ(FromGammu(sms.Number), Widen(m.number));
        EXPECT_EQ(sms.Coding,
                  m.ucs2 ? SMS_Coding_Unicode_No_Compression : SMS_Coding_Default_No_Compression);
        // A 7-bit body went out as ISO 8859-1 text; gammu shows each code as its character.
        const std::u16string expected =
            m.ucs2 ? m.text : Widen(std::string(record.text, record.length));
        ASSERT_EQ(FromGammu(sms.Text), expected);
    }
}

TEST(GammuCodec, GammuPdusReadThroughOurParser) {
    Generator generator(AllCodes());
    int submits = 0, delivers = 0;
    for (int i = 0; i < kMessages; ++i) {
        const Generated m = generator.Next(i);
        const bool submit = i % 4 == 1;
        const char* centre = i % 5 == 0 ? "" : i % 5 == 1 ? "+3097100000" : "2101234";
        SCOPED_TRACE("message " + std::to_string(i) + " from " + m.number);
        const std::string pdu = GammuEncode(m, submit, centre);
        ASSERT_FALSE(pdu.empty());
        const int stat = submit ? 2 : i % 2;
        const std::string reply = "\r\n+CMGR: " + std::to_string(stat) + ",," +
                                  std::to_string(pdu.size() / 2 - 1) + "\r\n" + pdu +
                                  "\r\n\r\nOK\r\n";
        SmsRecord record{};
        ASSERT_EQ(SmsParsePduReply(reply.data(), static_cast<int>(reply.size()), &record), 1)
            << pdu;
        EXPECT_STREQ(record.number, m.number.c_str());
        EXPECT_STREQ(record.status, submit ? "STO UNSENT" : stat == 0 ? "REC UNREAD" : "REC READ");
        EXPECT_STREQ(record.date, submit ? "" : "14:25:36,11/03/2002");
        if (m.ucs2) {
            char hex[400];
            const int digits = TextToUcs2Hex(m.text.data(), m.text.size() * 2, hex, sizeof hex);
            EXPECT_EQ(record.coding, 8);
            EXPECT_EQ(record.length, digits);
            ASSERT_STREQ(record.text, hex);
        } else {
            EXPECT_EQ(record.coding, 0);
            ASSERT_EQ(std::string(record.text, record.length), ShownCodes(m.codes));
        }
        ++(submit ? submits : delivers);
    }
    EXPECT_GT(submits, kMessages / 5);
    EXPECT_GT(delivers, kMessages / 2);
}

}  // namespace
}  // namespace vqm
