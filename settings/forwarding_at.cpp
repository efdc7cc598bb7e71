#include "settings/forwarding_at.h"

#include <cstdint>
#include <cstdio>
#include <cstring>

#include "link/link.h"
#include "settings/at_common.h"
#include "support/field_cursor.h"
#include "support/numbers.h"
#include "support/text.h"

namespace vqm {

using settings_detail::CommandResult;

namespace {

constexpr char kCcfcTag[] = "+CCFC:";

bool ValidPair(int serviceClass, int reason) {
    return serviceClass >= 1 && serviceClass <= 4 && reason >= 0 && reason <= 3;
}

}  // namespace

int ParseForwardReply(const char* reply, int length, char16_t* number, size_t numberSize) {
    FieldCursor cursor(reply, length);
    if (!cursor.SeekPast(kCcfcTag)) return -1;
    const FieldCursor afterTag = cursor;
    int32_t status = 0, reportedClass = 0;
    if (settings_detail::ScanStatusAndClass(cursor, &status, &reportedClass) == 0) return -1;
    if (status != 1) return 0;
    // The number is the first quoted field from the tag on, whatever the class field held.
    FieldCursor numberField = afterTag;
    char narrow[64];
    int narrowLength = 0;
    numberField.SeekQuoted(narrow, sizeof narrow, &narrowLength);
    if (number && numberSize > 0) NarrowToWide(narrow, number, narrowLength, numberSize);
    return 1;
}

int QueryForward(Link& link, int serviceClass, int reason, char16_t* number, size_t numberSize,
                 CardError* error) {
    if (error) *error = CardError{};
    if (!ValidPair(serviceClass, reason)) return -1;
    char command[32], reply[256];
    std::snprintf(command, sizeof command, "AT+CCFC=%d,2,,,%d\r", reason, serviceClass);
    const int length = static_cast<int>(AtCommand(link, command, reply, sizeof reply));
    if (length == 0) return -1;
    ParseCardError(reply, length, error);
    return ParseForwardReply(reply, length, number, numberSize);
}

int ActivateForward(Link& link, int serviceClass, int reason, const char16_t* number, int seconds,
                    CardError* error) {
    if (error) *error = CardError{};
    if (!ValidPair(serviceClass, reason) || !number) return -1;
    char narrow[32];
    WideToNarrowBounded(number, narrow, sizeof narrow);
    if (!settings_detail::Quotable(narrow)) return -1;
    const int type = std::strchr(narrow, '+') ? 145 : 129;
    char command[96];
    std::snprintf(command, sizeof command, "AT+CCFC=%d,3,\"%s\",%d,%d,,,%d\r", reason, narrow, type,
                  serviceClass, seconds);
    return CommandResult(link, command, error);
}

int EraseForward(Link& link, int serviceClass, int reason, CardError* error) {
    if (error) *error = CardError{};
    if (!ValidPair(serviceClass, reason)) return -1;
    char command[32];
    std::snprintf(command, sizeof command, "AT+CCFC=%d,4,,,%d\r", reason, serviceClass);
    return CommandResult(link, command, error);
}

int DisableAllForwards(Link& link, int serviceClass, CardError* error) {
    if (error) *error = CardError{};
    // Reason 4 is every forward, mode 0 disables.
    switch (serviceClass) {
        case 1:
            return CommandResult(link, "AT+CCFC=4,0,,,1\r", error);
        case 2:
            return CommandResult(link, "AT+CCFC=4,0,,,2\r", error);
        case 4:
            return CommandResult(link, "AT+CCFC=4,0,,,4\r", error);
        default:
            return -1;
    }
}

int DisableAllForwardsAllClasses(Link& link, CardError* error) {
    return CommandResult(link, "AT+CCFC=4,0,,,7\r", error);
}

}  // namespace vqm
