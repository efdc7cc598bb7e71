// Call forwarding through "+CCFC": per service class (1 voice, 2 data, 4 fax; 7 all three) and
// reason (0 unconditional, 1 busy, 2 no reply, 3 not reachable).
#pragma once

#include <cstddef>

#include "settings/at_common.h"

namespace vqm {

struct Link;

inline constexpr int kForwardUnconditional = 0;
inline constexpr int kForwardBusy = 1;
inline constexpr int kForwardNoReply = 2;
inline constexpr int kForwardNotReachable = 3;

// The wrappers below return -1 for a class outside 1..4 or a reason outside 0..3 (nothing is
// sent) and when no reply came. A card's "+CME ERROR" is a failure (4, or -1 for a query that
// finds no "+CCFC:"); error, when given, receives its reason.

// "AT+CCFC=<reason>,2,,,<class>": 1 with the forwarded-to number in number, 0 when the
// forward is not active, -1 without "+CCFC:" in the reply.
int QueryForward(Link& link, int serviceClass, int reason, char16_t* number, size_t numberSize,
                 CardError* error = nullptr);
// The query reply's scan on its own: 1 (number filled, empty when none is quoted), 0, or -1
// when there is no "+CCFC:" with a readable status.
int ParseForwardReply(const char* reply, int length, char16_t* number, size_t numberSize);

// Registers and activates the forward to number (type 145 when it holds a '+', else 129) with
// the no-reply time in seconds. The final result code.
int ActivateForward(Link& link, int serviceClass, int reason, const char16_t* number, int seconds,
                    CardError* error = nullptr);

// Erases the forward of one class and reason. The final result code.
int EraseForward(Link& link, int serviceClass, int reason, CardError* error = nullptr);

// Disables every forward of class 1, 2 or 4 (any other class: -1, nothing sent), and of all
// three classes. The final result code.
int DisableAllForwards(Link& link, int serviceClass, CardError* error = nullptr);
int DisableAllForwardsAllClasses(Link& link, CardError* error = nullptr);

}  // namespace vqm
