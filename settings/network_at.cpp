#include "settings/network_at.h"

#include <algorithm>
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
    // A query the card answers at once: a silent card must not hold the port for ever.
    const int length = static_cast<int>(
        AtCommandWithin(link, "AT+COPS?\r", reply, sizeof reply, kQueryAnswerLimitMs));
    return length == 0 ? -1 : ParseNetworkMode(reply, length);
}

int NetworkAutomatic(Link& link) {
    return CommandResult(link, "AT+COPS=0\r");
}

int NetworkRegisterListed(Link& link, const char16_t* name, int32_t fallbackCode) {
    if (!name) return -1;
    char narrow[kOperatorNameSize];
    WideToNarrowBounded(name, narrow, sizeof narrow);
    int32_t code = OperatorCodeByName(narrow);
    if (code == -1) code = fallbackCode > 0 ? fallbackCode : -1;
    if (code == -1) return -1;
    char command[32];
    std::snprintf(command, sizeof command, "AT+COPS=1,2,%d\r", static_cast<int>(code));
    return CommandResult(link, command);
}

int NetworkRegister(Link& link, const char16_t* name) {
    return NetworkRegisterListed(link, name, -1);
}

namespace {

// The digits of a quoted numeric operator ("20201"); -1 when it holds anything else.
int32_t CodeOf(const char* text, int length) {
    if (length <= 0 || length > 9) return -1;
    int32_t code = 0;
    for (int i = 0; i < length; ++i) {
        if (text[i] < '0' || text[i] > '9') return -1;
        code = code * 10 + (text[i] - '0');
    }
    return code;
}

// The standard layout: bracketed entries "(<stat>,\"<long>\",\"<short>\",\"<numeric>\"[,<act>])"
// up to the first one that is not a network (the lists of supported modes and formats).
void ParseBracketedSearch(FieldCursor cursor, OperatorName* names, int32_t* codes, int maxNames,
                          int* found) {
    for (;;) {
        cursor.SkipBlanks();
        if (*found >= maxNames || cursor.AtLineEnd() || !cursor.Literal("(")) return;
        int32_t status = 0;
        char longName[64], shortName[64], numeric[16];
        int longLength = 0, shortLength = 0, numericLength = 0;
        if (!(cursor.NextInt(&status) && cursor.Comma() &&
              cursor.NextQuoted(longName, sizeof longName, &longLength) && cursor.Comma() &&
              cursor.NextQuoted(shortName, sizeof shortName, &shortLength) && cursor.Comma() &&
              cursor.NextQuoted(numeric, sizeof numeric, &numericLength)))
            return;
        const int32_t code = CodeOf(numeric, numericLength);
        char name[kOperatorNameSize] = "";
        if (code < 0 || OperatorNameByCode(static_cast<uint32_t>(code), name, sizeof name) == 0) {
            // The table does not know it: the modem's own name says more than digits.
            const char* own = longLength > 0 ? longName : shortLength > 0 ? shortName : numeric;
            const size_t n = std::min(std::strlen(own), sizeof name - 1);
            std::memcpy(name, own, n);
            name[n] = '\0';
        }
        NarrowToWide(name, names[*found], static_cast<int>(std::strlen(name)), kOperatorNameSize);
        if (codes) codes[*found] = code;
        ++*found;
        // Whatever else the entry carries (the access technology) up to its bracket and the
        // comma before the next one.
        const char* p = cursor.Position();
        while (p < cursor.End() && *p != ')' && *p != '\r' && *p != '\n')
            ++p;
        if (p == cursor.End() || *p != ')') return;
        cursor = FieldCursor(p + 1, cursor.End());
        cursor.Comma();
    }
}

}  // namespace

int ParseOperatorSearch(const char* reply, int length, OperatorName* names, int maxNames,
                        int* count, int32_t* codes) {
    if (!reply || length <= 0) return -1;
    const int at = FindPattern(0, kCopsTag, kCopsTagLength, reply, length);
    if (at < 0) return -1;
    if (count) *count = 0;
    const char* end = reply + length;
    if (!names || maxNames <= 0) return 1;

    FieldCursor bracketed(reply + at + kCopsTagLength, end);
    bracketed.SkipBlanks();
    if (bracketed.Literal("(")) {
        int found = 0;
        ParseBracketedSearch(FieldCursor(reply + at + kCopsTagLength, end), names, codes, maxNames,
                             &found);
        if (count) *count = found;
        return 1;
    }

    // The name of the last entry found: an unknown code takes it over.
    char work[kOperatorNameSize] = "";
    int found = 0;
    for (int pos = at + 7; pos < length && found < maxNames; pos += 10) {
        // Each entry stands at a fixed stride from the tag, as the card lays its list out.
        FieldCursor entry(reply + pos, end);
        int32_t status = 0, code = 0;
        if (!ScanInt(entry, &status) || !entry.Literal(",,,") || !ScanInt(entry, &code)) break;
        (void)status;  // forbidden and current networks are listed like the others
        if (code < 0 || OperatorNameByCode(static_cast<uint32_t>(code), work, sizeof work) == 0) {
            if (work[0] == '\0') std::snprintf(work, sizeof work, "%d", static_cast<int>(code));
        }
        NarrowToWide(work, names[found], static_cast<int>(std::strlen(work)), kOperatorNameSize);
        if (codes) codes[found] = code;
        ++found;
        if (count) *count = found;
    }
    return 1;
}

int NetworkSearchCodes(Link& link, OperatorName* names, int32_t* codes, int maxNames, int* count) {
    static_assert(kSearchReplySize >= 256);
    char reply[kSearchReplySize];
    const int length = static_cast<int>(AtCommand(link, "AT+COPS=?\r", reply, sizeof reply));
    if (length == 0) return -1;
    return ParseOperatorSearch(reply, length, names, maxNames, count, codes);
}

int NetworkSearch(Link& link, OperatorName* names, int maxNames, int* count) {
    return NetworkSearchCodes(link, names, nullptr, maxNames, count);
}

}  // namespace vqm
