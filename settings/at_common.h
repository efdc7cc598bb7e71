// What the settings wrappers share: one command sent for its final result, the card's own
// error reports, and the integer reading over reply fields, which skips blanks and line ends
// before a number as the card's replies need.
#pragma once

#include <cstdint>

namespace vqm {

struct Link;
class FieldCursor;

// The reason a card gave with "+CME ERROR: <n>" (equipment and network) or "+CMS ERROR: <n>"
// (messages). A modem in verbose error mode gives a text instead of a number; code is then -1
// and text holds what it said.
struct CardError {
    enum Kind { None, Equipment, Message };
    Kind kind = None;
    int code = -1;
    char text[64] = "";
};

// Reads the card's error report out of a reply: 1 when there is one (error filled), else 0
// (error cleared).
int ParseCardError(const char* reply, int length, CardError* error);
// What a person is told about a reported error, in a few words ("incorrect password",
// "SIM PUK required", ...); empty when nothing was reported.
const char* CardErrorReason(const CardError& error);

// The final result of a settings reply: the link's codes, and 4 (ERROR) for a "+CME ERROR" or
// "+CMS ERROR" line, which the link's table does not know. Every caller already treats 4 as a
// failure, so the card's own refusals are failures there too instead of an answer without a
// result (-1). error, when given, receives the reason.
int SettingsResult(const char* reply, int length, CardError* error);

namespace settings_detail {

// Whether text may stand between the quotes of a command: no quote, no control character (a
// CR would end the command early and a quote would open a field of its own).
bool Quotable(const char* text);

// The final result code of the reply to command (SettingsResult); -1 when no reply came.
int CommandResult(Link& link, const char* command, CardError* error = nullptr);

// Skips blanks, tabs and line ends, then reads a decimal integer: 1, or 0 (cursor unmoved
// past the space) when no number stands there.
int ScanInt(FieldCursor& cursor, int32_t* value);

// The "<status>[,<class>]" pair at the cursor (just after a reply's tag). Returns 0 when no
// status can be read, 1 with only the status, 2 with both.
int ScanStatusAndClass(FieldCursor& cursor, int32_t* status, int32_t* serviceClass);

}  // namespace settings_detail
}  // namespace vqm
