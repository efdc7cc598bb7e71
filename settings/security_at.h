// The card's and the network's codes through "+CLCK" and "+CPWD". Codes by index: 0 "SC"
// (PIN), 1 "P2" (PIN2), 2 "PS" (security code), 3 "AB" (barring password). An index outside
// 0..3 returns -1 without sending anything.
#pragma once

#include "settings/at_common.h"

namespace vqm {

struct Link;

inline constexpr int kSecurityCodeCount = 4;
// The facility of a code index; nullptr outside 0..3.
const char* SecurityFacility(int index);

// "AT+CLCK=<fac>,2": the status (0 off, 1 on); without "+CLCK:" the reply's final result
// code (4 for a "+CME ERROR" too); -1 when no reply came or the status cannot be read. error,
// when given, receives the card's reason for a refusal here and below.
int QueryLock(Link& link, int index, CardError* error = nullptr);
int ParseLockReply(const char* reply, int length, CardError* error = nullptr);

// "AT+CLCK=<fac>,<mode>,<code>,7" with mode 0 (off) or 1 (on); another mode returns -1.
// The final result code, -1 when no reply came.
int SetLock(Link& link, int index, int mode, const char16_t* code, CardError* error = nullptr);

// "AT+CPWD=<fac>,<old>,<new>,7". The final result code, -1 when no reply came.
int ChangeCode(Link& link, int index, const char16_t* oldCode, const char16_t* newCode,
               CardError* error = nullptr);

}  // namespace vqm
