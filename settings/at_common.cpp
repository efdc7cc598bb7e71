#include "settings/at_common.h"

#include <cstring>

#include "link/link.h"
#include "support/field_cursor.h"

namespace vqm {

namespace {

constexpr int kResultError = 4;

struct Reason {
    int code;
    const char* text;
};
// The 27.007 codes a person can act on, as its verbose mode words them.
constexpr Reason kEquipmentReasons[] = {
    {0, "phone failure"},
    {3, "operation not allowed"},
    {4, "operation not supported"},
    {10, "SIM not inserted"},
    {11, "SIM PIN required"},
    {12, "SIM PUK required"},
    {13, "SIM failure"},
    {14, "SIM busy"},
    {15, "SIM wrong"},
    {16, "incorrect password"},
    {17, "SIM PIN2 required"},
    {18, "SIM PUK2 required"},
    {30, "no network service"},
    {31, "network timeout"},
    {100, "unknown"},
};
constexpr Reason kMessageReasons[] = {
    {302, "operation not allowed"}, {303, "operation not supported"},
    {310, "SIM not inserted"},      {311, "SIM PIN required"},
    {313, "SIM failure"},           {316, "SIM PUK required"},
    {322, "memory full"},           {330, "SMSC address unknown"},
    {331, "no network service"},    {500, "unknown error"},
};

}  // namespace

int ParseCardError(const char* reply, int length, CardError* error) {
    CardError found;
    FieldCursor cursor(reply, length);
    const char* tags[] = {"+CME ERROR:", "+CMS ERROR:"};
    for (int kind = 0; kind < 2 && found.kind == CardError::None; ++kind) {
        FieldCursor at = cursor;
        if (!at.NextTag(tags[kind])) continue;
        found.kind = kind == 0 ? CardError::Equipment : CardError::Message;
        int32_t code = -1;
        FieldCursor number = at;
        if (number.NextInt(&code) && number.AtLineEnd() && code >= 0) {
            found.code = code;
        } else {
            // A worded report: keep its text up to the line end.
            at.SkipBlanks();
            size_t n = 0;
            for (const char* p = at.Position();
                 p < at.End() && *p != '\r' && *p != '\n' && n + 1 < sizeof found.text; ++p)
                found.text[n++] = *p;
            found.text[n] = '\0';
        }
    }
    if (error) *error = found;
    return found.kind != CardError::None;
}

const char* CardErrorReason(const CardError& error) {
    if (error.kind == CardError::None) return "";
    if (error.code < 0) return error.text;
    if (error.kind == CardError::Equipment) {
        for (const Reason& reason : kEquipmentReasons)
            if (reason.code == error.code) return reason.text;
    } else {
        for (const Reason& reason : kMessageReasons)
            if (reason.code == error.code) return reason.text;
    }
    return "error reported by the card";
}

int SettingsResult(const char* reply, int length, CardError* error) {
    const int result = AtFinalResult(reply, length);
    const int reported = ParseCardError(reply, length, error);
    return result == -1 && reported ? kResultError : result;
}

namespace settings_detail {

bool Quotable(const char* text) {
    for (const char* p = text; *p; ++p)
        if (*p == '"' || static_cast<unsigned char>(*p) < 0x20) return false;
    return true;
}

int CommandResult(Link& link, const char* command, CardError* error) {
    if (error) *error = CardError{};
    char reply[256];
    const int length = static_cast<int>(AtCommand(link, command, reply, sizeof reply));
    return length == 0 ? -1 : SettingsResult(reply, length, error);
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

}  // namespace settings_detail
}  // namespace vqm
