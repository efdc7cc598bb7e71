#include "settings/barring_at.h"

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

constexpr char kFacilities[kBarringFacilityCount][3] = {"AO", "OI", "OX", "AI",
                                                        "IR", "AB", "AG", "AC"};
constexpr int kAllBarrings = 5;
constexpr char kClckTag[] = "+CLCK:";
constexpr size_t kPasswordSize = 32;

int SendLockCommand(Link& link, int facility, int mode, const char16_t* password, int serviceClass,
                    CardError* error) {
    char narrow[kPasswordSize] = "";
    if (password) WideToNarrowBounded(password, narrow, sizeof narrow);
    if (!settings_detail::Quotable(narrow)) return -1;
    char command[80];
    std::snprintf(command, sizeof command, "AT+CLCK=\"%s\",%d,\"%s\",%d\r", kFacilities[facility],
                  mode, narrow, serviceClass);
    return CommandResult(link, command, error);
}

}  // namespace

const char* BarringFacility(int facility) {
    return facility >= 0 && facility < kBarringFacilityCount ? kFacilities[facility] : nullptr;
}

int ParseBarringReply(const char* reply, int length, int serviceClass, CardError* error) {
    if (error) *error = CardError{};
    if (!reply || length <= 0) return -1;
    FieldCursor cursor(reply, length);
    if (!cursor.SeekPast(kClckTag)) return SettingsResult(reply, length, error);
    // One line with the barred classes summed (the card), or one line per class (27.007
    // modems: "+CLCK: 0,1", "+CLCK: 1,4", ...): barred when any line says so for a class that
    // shares a bit with the asked one. The first line must be readable; a later one that is
    // not is passed over.
    bool first = true;
    do {
        int32_t status = 0, reportedClass = 0;
        const int fields = settings_detail::ScanStatusAndClass(cursor, &status, &reportedClass);
        if (fields == 0 && first) return -1;
        first = false;
        if (fields == 0 || status == 0) continue;
        if (fields == 1) return 1;  // a lock that is not kept per class bars every class
        if ((reportedClass & serviceClass & 0xFF) != 0) return 1;
    } while (cursor.SeekPast(kClckTag));
    return 0;
}

int QueryBarring(Link& link, int serviceClass, int facility, CardError* error) {
    if (error) *error = CardError{};
    if (serviceClass < 1 || serviceClass > 4 || !BarringFacility(facility)) return -1;
    // Room for a line per class of a modem that lists all eight.
    char command[32], reply[512];
    std::snprintf(command, sizeof command, "AT+CLCK=\"%s\",2\r", kFacilities[facility]);
    const int length = static_cast<int>(AtCommand(link, command, reply, sizeof reply));
    if (length == 0) return -1;
    return ParseBarringReply(reply, length, serviceClass, error);
}

int LockBarring(Link& link, int serviceClass, int facility, const char16_t* password,
                CardError* error) {
    if (error) *error = CardError{};
    if (serviceClass < 1 || serviceClass > 4 || facility < 0 || facility > 4) return 0;
    return SendLockCommand(link, facility, 1, password, serviceClass, error);
}

int UnlockBarring(Link& link, int serviceClass, int facility, const char16_t* password,
                  CardError* error) {
    if (error) *error = CardError{};
    if (serviceClass < 1 || serviceClass > 4 || facility < 5 || facility > 7) return 0;
    return SendLockCommand(link, facility, 0, password, serviceClass, error);
}

int UnlockAllBarrings(Link& link, const char16_t* password, CardError* error) {
    return SendLockCommand(link, kAllBarrings, 0, password, 7, error);
}

}  // namespace vqm
