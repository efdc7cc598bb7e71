#include "settings/call_waiting_at.h"

#include <cstdint>

#include "link/link.h"
#include "support/field_cursor.h"

namespace vqm {

namespace {
constexpr char kCcwaTag[] = "+CCWA:";
// The network answers a supplementary-service request in seconds; a card silent this long
// will not answer, and the page's buttons must not stay grey for ever.
constexpr int kNetworkAnswerLimitMs = 30000;
}  // namespace

int ParseCallWaitingReply(const char* reply, int length) {
    if (!reply || length <= 0) return kWaitingUnknown;
    FieldCursor cursor(reply, length);
    int result = kWaitingUnknown;
    while (cursor.NextTag(kCcwaTag)) {
        int32_t status = -1, serviceClass = kCallWaitingVoice;
        // Fields are read on this line only: a bare tag must not borrow the next line's digits.
        if (!cursor.NextInt(&status) || (status != 0 && status != 1)) continue;
        FieldCursor classField = cursor;
        if (classField.Comma() && !classField.NextInt(&serviceClass)) continue;
        if (status == 1 && (serviceClass & kCallWaitingVoice)) return kWaitingActive;
        result = kWaitingNotActive;
    }
    return result;
}

int ParseCallWaitingLine(const char* text, int length, char* number, size_t numberSize) {
    if (!number || numberSize == 0) return 0;
    number[0] = '\0';
    if (!text || length <= 0) return 0;
    FieldCursor cursor(text, length);
    if (!cursor.NextTag(kCcwaTag)) return 0;
    char digits[64];
    int n = 0;
    if (!cursor.NextQuoted(digits, sizeof digits, &n) || n == 0) return 0;
    int32_t type = 0;
    const bool international = cursor.Comma() && cursor.NextInt(&type) && type == 145;
    size_t out = 0;
    if (international && digits[0] != '+' && numberSize > 1) number[out++] = '+';
    for (const char* from = digits; *from && out + 1 < numberSize;)
        number[out++] = *from++;
    number[out] = '\0';
    return static_cast<int>(out);
}

int QueryCallWaiting(Link& link) {
    char reply[256];
    const int length = static_cast<int>(
        AtCommandWithin(link, "AT+CCWA=1,2,1\r", reply, sizeof reply, kNetworkAnswerLimitMs));
    if (length == 0) return kWaitingUnknown;
    return ParseCallWaitingReply(reply, length);
}

int PresentCallWaiting(Link& link) {
    char reply[256];
    const int length = static_cast<int>(
        AtCommandWithin(link, "AT+CCWA=1\r", reply, sizeof reply, kQueryAnswerLimitMs));
    return length == 0 ? -1 : AtFinalResult(reply, length);
}

int SetCallWaiting(Link& link, int enable) {
    char reply[256];
    const int length =
        static_cast<int>(AtCommandWithin(link, enable ? "AT+CCWA=1,1,1\r" : "AT+CCWA=1,0,1\r",
                                         reply, sizeof reply, kNetworkAnswerLimitMs));
    return length == 0 ? -1 : AtFinalResult(reply, length);
}

}  // namespace vqm
