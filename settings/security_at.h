// The card's and the network's codes through "+CLCK" and "+CPWD". Codes by index: 0 "SC"
// (PIN), 1 "P2" (PIN2), 2 "PS" (security code), 3 "AB" (barring password). An index outside
// 0..3 returns -1 without sending anything.
#pragma once

namespace vqm {

struct Link;

inline constexpr int kSecurityCodeCount = 4;
// The facility of a code index; nullptr outside 0..3.
const char* SecurityFacility(int index);

// "AT+CLCK=<fac>,2": the status (0 off, 1 on); without "+CLCK:" the reply's final result
// code; -1 when no reply came or the status cannot be read.
int QueryLock(Link& link, int index);
int ParseLockReply(const char* reply, int length);

// "AT+CLCK=<fac>,<mode>,<code>,7" with mode 0 (off) or 1 (on); another mode returns -1.
// The final result code, -1 when no reply came.
int SetLock(Link& link, int index, int mode, const char16_t* code);

// "AT+CPWD=<fac>,<old>,<new>,7". The final result code, -1 when no reply came.
int ChangeCode(Link& link, int index, const char16_t* oldCode, const char16_t* newCode);

}  // namespace vqm
