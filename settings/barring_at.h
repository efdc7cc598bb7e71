// Call barring through the facility lock "+CLCK", guarded by the network's 4-digit barring
// password. Facilities by index: 0 "AO", 1 "OI", 2 "OX", 3 "AI", 4 "IR" (lockable) and
// 5 "AB", 6 "AG", 7 "AC" (unlock only). Service class 1 voice, 2 data, 4 fax; 7 all three.
#pragma once

#include "settings/at_common.h"

namespace vqm {

struct Link;

inline constexpr int kBarringFacilityCount = 8;
// The two-letter facility of an index 0..7; nullptr outside.
const char* BarringFacility(int facility);

// "AT+CLCK=<fac>,2": 1 when a reported class with status 1 shares a bit with serviceClass, 0
// when none does; every "+CLCK:" line is read, so a reply of one line per class counts as well
// as one line with the classes summed. Without "+CLCK:" the reply's final result code (so ERROR
// and a "+CME ERROR" show as 4, never as "not barred"). -1 for a class outside 1..4 or a facility
// outside 0..7.
int QueryBarring(Link& link, int serviceClass, int facility, CardError* error = nullptr);
// The query reply's scan on its own (a status of 1 without a class counts as barred; a first
// "+CLCK:" line without a status is -1).
int ParseBarringReply(const char* reply, int length, int serviceClass, CardError* error = nullptr);

// "AT+CLCK=<fac>,1,<password>,<class>" for facilities 0..4. The final result code, -1 when no
// reply came; a password holding a quote or a control character sends nothing and returns -1.
// A class outside 1..4 or a facility outside 0..4 sends nothing and returns 0,
// the value of success: callers never pass such values.
int LockBarring(Link& link, int serviceClass, int facility, const char16_t* password,
                CardError* error = nullptr);
// "AT+CLCK=<fac>,0,<password>,<class>" for facilities 5..7; the same results.
int UnlockBarring(Link& link, int serviceClass, int facility, const char16_t* password,
                  CardError* error = nullptr);
// "AT+CLCK=\"AB\",0,<password>,7". The final result code, -1 when no reply came.
int UnlockAllBarrings(Link& link, const char16_t* password, CardError* error = nullptr);

}  // namespace vqm
