#include "settings/at_common.h"

#include "link/link.h"
#include "support/text.h"

namespace vqm::settings_detail {

int CommandResult(Link& link, const char* command) {
    char reply[256];
    const int length = static_cast<int>(AtCommand(link, command, reply, sizeof reply));
    return length == 0 ? -1 : AtFinalResult(reply, length);
}

const char* ScanInt(const char* p, const char* end, int32_t* value) {
    if (!p || !end) return nullptr;
    while (p < end && (*p == ' ' || *p == '\t' || *p == '\r' || *p == '\n'))
        ++p;
    return ParseInt(p, end, value);
}

int ScanStatusAndClass(const char* reply, int length, int tagAt, int tagLength, int32_t* status,
                       int32_t* serviceClass) {
    if (!reply || tagAt < 0 || tagLength < 0 || tagAt + tagLength > length) return 0;
    const char* end = reply + length;
    const char* p = ScanInt(reply + tagAt + tagLength, end, status);
    if (!p) return 0;
    if (p >= end || *p != ',') return 1;
    return ScanInt(p + 1, end, serviceClass) ? 2 : 1;
}

}  // namespace vqm::settings_detail
