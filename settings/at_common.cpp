#include "settings/at_common.h"

#include "link/link.h"
#include "support/field_cursor.h"

namespace vqm::settings_detail {

int CommandResult(Link& link, const char* command) {
    char reply[256];
    const int length = static_cast<int>(AtCommand(link, command, reply, sizeof reply));
    return length == 0 ? -1 : AtFinalResult(reply, length);
}

int ScanInt(FieldCursor& cursor, int32_t* value) {
    cursor.SkipSpace();
    return cursor.NextInt(value);
}

int ScanStatusAndClass(FieldCursor& cursor, int32_t* status, int32_t* serviceClass) {
    if (!ScanInt(cursor, status)) return 0;
    if (!cursor.Comma()) return 1;
    return ScanInt(cursor, serviceClass) ? 2 : 1;
}

}  // namespace vqm::settings_detail
