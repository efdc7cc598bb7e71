// Our PDU codec against gammu's on the same 10,000 messages: each message is built as an
// SMS-SUBMIT PDU in hexadecimal and read back to its number and text, once through
// BuildSubmitPdu and the "+CMGR:" parser, once through gammu's frame encoder and PDU decoder.
// Prints the best of a few rounds for each and the ratio.
#include <gammu.h>

#include <algorithm>
#include <chrono>
#include <cstdio>
#include <cstring>
#include <random>
#include <string>
#include <vector>

#include "messaging/sms_at.h"
#include "support/gsm.h"

namespace {

using Clock = std::chrono::steady_clock;

constexpr int kMessages = 10000;
constexpr int kRounds = 5;

struct Message {
    vqm::SmsRecord record{};
    GSM_SMSMessage gammu{};
};

void ToGammu(const std::u16string& text, unsigned char* out) {
    size_t i = 0;
    for (char16_t unit : text) {
        out[i++] = static_cast<unsigned char>(unit >> 8);
        out[i++] = static_cast<unsigned char>(unit & 0xFF);
    }
    out[i] = out[i + 1] = 0;
}

// Two in three messages 7-bit, the rest UCS2; numbers national and international.
std::vector<Message> MakeMessages() {
    std::mt19937 engine(1409u);
    auto pick = [&](unsigned n) { return static_cast<unsigned>(engine() % n); };
    std::vector<Message> messages(kMessages);
    for (int i = 0; i < kMessages; ++i) {
        Message& m = messages[i];
        std::string number = i % 2 ? "+" : "";
        const unsigned digits = 3 + pick(16);
        for (unsigned d = 0; d < digits; ++d)
            number.push_back(static_cast<char>('1' + pick(9)));
        std::u16string text;
        const bool ucs2 = i % 3 == 2;
        const unsigned count = ucs2 ? pick(71) : pick(161);
        for (unsigned c = 0; c < count; ++c)
            text.push_back(ucs2 ? static_cast<char16_t>(0x400 + pick(0x100))
                                : static_cast<char16_t>(u'a' + pick(26)));

        std::snprintf(m.record.number, sizeof m.record.number, "%s", number.c_str());
        if (ucs2) {
            m.record.coding = 8;
            m.record.length = vqm::TextToUcs2Hex(text.data(), text.size() * 2, m.record.text,
                                                 sizeof m.record.text);
        } else {
            for (size_t c = 0; c < text.size(); ++c)
                m.record.text[c] = static_cast<char>(text[c]);
            m.record.length = static_cast<int32_t>(text.size());
        }

        GSM_SetDefaultSMSData(&m.gammu);
        m.gammu.PDU = SMS_Submit;
        m.gammu.Class = -1;
        m.gammu.UDH.Type = UDH_NoUDH;
        m.gammu.Coding =
            ucs2 ? SMS_Coding_Unicode_No_Compression : SMS_Coding_Default_No_Compression;
        m.gammu.SMSC.Number[0] = m.gammu.SMSC.Number[1] = 0;
        m.gammu.SMSC.Validity.Format = SMS_Validity_RelativeFormat;
        m.gammu.SMSC.Validity.Relative = SMS_VALID_1_Day;
        ToGammu(std::u16string(number.begin(), number.end()), m.gammu.Number);
        ToGammu(text, m.gammu.Text);
        m.gammu.Length = static_cast<int>(text.size());
    }
    return messages;
}

// Build and parse through our code; returns a checksum so that nothing is optimised away.
long RunOurs(const std::vector<Message>& messages) {
    long sum = 0;
    char reply[vqm::kSmsReadReplySize];
    for (const Message& m : messages) {
        char pdu[vqm::kSmsPduCommandSize];
        const int octets = vqm::BuildSubmitPdu(m.record, pdu, sizeof pdu);
        const int length =
            std::snprintf(reply, sizeof reply, "\r\n+CMGR: 2,,%d\r\n%s\r\n\r\nOK\r\n", octets, pdu);
        vqm::SmsRecord back{};
        sum += vqm::SmsParsePduReply(reply, length, &back) + back.length + back.number[1];
    }
    return sum;
}

// The same through gammu: encode the frame, lay it out as the PDU on the line in hexadecimal,
// then decode that hexadecimal text back.
long RunGammu(std::vector<Message>& messages) {
    long sum = 0;
    const GSM_SMSMessageLayout& layout = PHONE_SMSSubmit;
    GSM_Debug_Info* debug = GSM_GetGlobalDebug();
    for (Message& m : messages) {
        unsigned char frame[1024];
        int frameLength = 0;
        GSM_EncodeSMSFrame(debug, &m.gammu, frame, layout, &frameLength, TRUE);
        unsigned char wire[400];
        size_t n = 0;
        auto take = [&](size_t at, size_t count) {
            std::memcpy(wire + n, frame + at, count);
            n += count;
        };
        take(layout.SMSCNumber, 1 + frame[layout.SMSCNumber]);
        take(layout.firstbyte, 1);
        take(layout.TPMR, 1);
        take(layout.Number, 2 + (frame[layout.Number] + 1) / 2);
        take(layout.TPPID, 1);
        take(layout.TPDCS, 1);
        take(layout.TPVP, 1);
        const int userDataLength = frame[layout.TPUDL];
        take(layout.TPUDL, 1);
        take(layout.Text, frame[layout.TPDCS] == 0 ? (userDataLength * 7 + 7) / 8 : userDataLength);
        char hex[800];
        EncodeHexBin(hex, wire, n);

        // Room behind the bytes: gammu's unpacking reads one octet past the user data.
        unsigned char bytes[408] = {};
        DecodeHexBin(bytes, reinterpret_cast<unsigned char*>(hex), n * 2);
        GSM_SMSMessage back;
        size_t end = 0;
        std::memset(&back, 0, sizeof back);  // the decoder fills in what it reads
        sum += GSM_DecodePDUFrame(debug, &back, bytes, n, &end, TRUE) == ERR_NONE;
        sum += back.Length + back.Number[3];
    }
    return sum;
}

template <typename F>
double BestMs(F&& run, long* sum) {
    double best = 1e300;
    for (int round = 0; round < kRounds; ++round) {
        const auto start = Clock::now();
        *sum = run();
        const double ms = std::chrono::duration<double, std::milli>(Clock::now() - start).count();
        best = std::min(best, ms);
    }
    return best;
}

}  // namespace

int main() {
    std::vector<Message> messages = MakeMessages();
    long ourSum = 0, gammuSum = 0;
    const double ours = BestMs([&] { return RunOurs(messages); }, &ourSum);
    const double gammu = BestMs([&] { return RunGammu(messages); }, &gammuSum);
    std::printf("PDU build + parse of %d messages (best of %d rounds)\n", kMessages, kRounds);
    std::printf("  ours:  %8.2f ms  (%.2f us a message)\n", ours, ours * 1000 / kMessages);
    std::printf("  gammu: %8.2f ms  (%.2f us a message)\n", gammu, gammu * 1000 / kMessages);
    std::printf("  gammu / ours: %.2f (above 1 means ours is faster)\n", gammu / ours);
    std::printf("  checksums %ld %ld\n", ourSum, gammuSum);
    return 0;
}
