// What the settings wrappers share: one command sent for its final result, and the integer
// walk over reply fields, which skips blanks before a number as the card's replies need.
#pragma once

#include <cstdint>

namespace vqm {

struct Link;

namespace settings_detail {

// The final result code of the reply to command; -1 when no reply came.
int CommandResult(Link& link, const char* command);

// Skips blanks, tabs and line ends, then reads a decimal integer before end. Returns a pointer
// past its digits, or nullptr when no number stands there.
const char* ScanInt(const char* p, const char* end, int32_t* value);

// The "<status>[,<class>]" pair after a reply tag found at tagAt (tagLength long). Returns 0
// when no status can be read, 1 with only the status, 2 with both.
int ScanStatusAndClass(const char* reply, int length, int tagAt, int tagLength, int32_t* status,
                       int32_t* serviceClass);

}  // namespace settings_detail
}  // namespace vqm
