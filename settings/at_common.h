// What the settings wrappers share: one command sent for its final result, and the integer
// reading over reply fields, which skips blanks and line ends before a number as the card's
// replies need.
#pragma once

#include <cstdint>

namespace vqm {

struct Link;
class FieldCursor;

namespace settings_detail {

// The final result code of the reply to command; -1 when no reply came.
int CommandResult(Link& link, const char* command);

// Skips blanks, tabs and line ends, then reads a decimal integer: 1, or 0 (cursor unmoved
// past the space) when no number stands there.
int ScanInt(FieldCursor& cursor, int32_t* value);

// The "<status>[,<class>]" pair at the cursor (just after a reply's tag). Returns 0 when no
// status can be read, 1 with only the status, 2 with both.
int ScanStatusAndClass(FieldCursor& cursor, int32_t* status, int32_t* serviceClass);

}  // namespace settings_detail
}  // namespace vqm
