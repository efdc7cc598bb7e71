#include "settings/security_at.h"

#include <cstdint>
#include <cstdio>

#include "link/link.h"
#include "settings/at_common.h"
#include "support/field_cursor.h"
#include "support/numbers.h"
#include "support/text.h"

namespace vqm {

using settings_detail::CommandResult;

namespace {

constexpr char kFacilities[kSecurityCodeCount][3] = {"SC", "P2", "PS", "AB"};
constexpr char kClckTag[] = "+CLCK:";
constexpr size_t kCodeSize = 32;

}  // namespace

const char* SecurityFacility(int index) {
    return index >= 0 && index < kSecurityCodeCount ? kFacilities[index] : nullptr;
}

int ParseLockReply(const char* reply, int length, CardError* error) {
    if (error) *error = CardError{};
    if (!reply || length <= 0) return -1;
    FieldCursor cursor(reply, length);
    if (!cursor.SeekPast(kClckTag)) return SettingsResult(reply, length, error);
    int32_t status = 0;
    if (!settings_detail::ScanInt(cursor, &status)) return -1;
    return status;
}

int QueryLock(Link& link, int index, CardError* error) {
    if (error) *error = CardError{};
    const char* facility = SecurityFacility(index);
    if (!facility) return -1;
    char command[32], reply[256];
    std::snprintf(command, sizeof command, "AT+CLCK=\"%s\",2\r", facility);
    const int length = static_cast<int>(AtCommand(link, command, reply, sizeof reply));
    if (length == 0) return -1;
    return ParseLockReply(reply, length, error);
}

int SetLock(Link& link, int index, int mode, const char16_t* code, CardError* error) {
    if (error) *error = CardError{};
    const char* facility = SecurityFacility(index);
    if (!facility || (mode != 0 && mode != 1)) return -1;
    char narrow[kCodeSize] = "";
    if (code) WideToNarrowBounded(code, narrow, sizeof narrow);
    if (!settings_detail::Quotable(narrow)) return -1;
    char command[80];
    std::snprintf(command, sizeof command, "AT+CLCK=\"%s\",%d,\"%s\",7\r", facility, mode, narrow);
    return CommandResult(link, command, error);
}

int ChangeCode(Link& link, int index, const char16_t* oldCode, const char16_t* newCode,
               CardError* error) {
    if (error) *error = CardError{};
    const char* facility = SecurityFacility(index);
    if (!facility) return -1;
    char oldNarrow[kCodeSize] = "", newNarrow[kCodeSize] = "";
    if (oldCode) WideToNarrowBounded(oldCode, oldNarrow, sizeof oldNarrow);
    if (newCode) WideToNarrowBounded(newCode, newNarrow, sizeof newNarrow);
    if (!settings_detail::Quotable(oldNarrow) || !settings_detail::Quotable(newNarrow)) return -1;
    char command[112];
    std::snprintf(command, sizeof command, "AT+CPWD=\"%s\",\"%s\",\"%s\",7\r", facility, oldNarrow,
                  newNarrow);
    return CommandResult(link, command, error);
}

}  // namespace vqm
