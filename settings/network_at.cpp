#include "settings/network_at.h"

#include <cstdint>
#include <cstdio>
#include <cstring>

#include "link/link.h"
#include "link/operators.h"
#include "settings/at_common.h"
#include "support/field_cursor.h"
#include "support/numbers.h"
#include "support/text.h"

namespace vqm {

using settings_detail::CommandResult;
using settings_detail::ScanInt;

namespace {

constexpr char kCopsTag[] = "+COPS:";
constexpr int kCopsTagLength = 6;
// The reply to a search lists every network the card hears; a busy border area runs long.
constexpr size_t kSearchReplySize = 2048;

}  // namespace

int CurrentOperatorName(Link& link, char16_t* name, size_t nameSize) {
    // The link's own operator query reads "+COPS?" exactly this way.
    return GetOperatorName(link, name, nameSize);
}

int ParseNetworkMode(const char* reply, int length) {
    FieldCursor cursor(reply, length);
    int32_t mode = -1;
    if (!cursor.SeekPast(kCopsTag) || !ScanInt(cursor, &mode)) return -1;
    return mode;
}

int NetworkMode(Link& link) {
    char reply[256];
    const int length = static_cast<int>(AtCommand(link, "AT+COPS?\r", reply, sizeof reply));
    return length == 0 ? -1 : ParseNetworkMode(reply, length);
}

int NetworkAutomatic(Link& link) {
    return CommandResult(link, "AT+COPS=0\r");
}

int NetworkRegister(Link& link, const char16_t* name) {
    if (!name) return -1;
    char narrow[kOperatorNameSize];
    WideToNarrowBounded(name, narrow, sizeof narrow);
    const int32_t code = OperatorCodeByName(narrow);
    if (code == -1) return -1;
    char command[32];
    std::snprintf(command, sizeof command, "AT+COPS=1,2,%d\r", static_cast<int>(code));
    return CommandResult(link, command);
}

int ParseOperatorSearch(const char* reply, int length, OperatorName* names, int maxNames,
                        int* count) {
    if (!reply || length <= 0) return -1;
    const int at = FindPattern(0, kCopsTag, kCopsTagLength, reply, length);
    if (at < 0) return -1;
    if (count) *count = 0;
    const char* end = reply + length;
    // The name of the last entry found: an unknown code takes it over.
    char work[kOperatorNameSize] = "";
    int found = 0;
    for (int pos = at + 7; pos < length && found < maxNames && names; pos += 10) {
        // Each entry stands at a fixed stride from the tag, as the card lays its list out.
        FieldCursor entry(reply + pos, end);
        int32_t status = 0, code = 0;
        if (!ScanInt(entry, &status) || !entry.Literal(",,,") || !ScanInt(entry, &code)) break;
        (void)status;  // forbidden and current networks are listed like the others
        if (code < 0 || OperatorNameByCode(static_cast<uint32_t>(code), work, sizeof work) == 0) {
            if (work[0] == '\0') std::snprintf(work, sizeof work, "%d", static_cast<int>(code));
        }
        NarrowToWide(work, names[found], static_cast<int>(std::strlen(work)), kOperatorNameSize);
        ++found;
        if (count) *count = found;
    }
    return 1;
}

int NetworkSearch(Link& link, OperatorName* names, int maxNames, int* count) {
    static_assert(kSearchReplySize >= 256);
    char reply[kSearchReplySize];
    const int length = static_cast<int>(AtCommand(link, "AT+COPS=?\r", reply, sizeof reply));
    if (length == 0) return -1;
    return ParseOperatorSearch(reply, length, names, maxNames, count);
}

}  // namespace vqm
