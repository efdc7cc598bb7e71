// The voice-call commands: dial, answer, hang up and key tones. Each is one exchange of the
// link's transaction; the dial is the one exchange whose wait another thread may cut short.
#pragma once

#include <atomic>

namespace vqm {

struct Link;

// "ATD<number>;": written with the port held throughout, the reply waited for, the port
// released. cancel (set to 1 by another thread) ends the wait at once, except on card firmware
// 3.81 and below, which cannot take a dial back once sent. Returns the final result found
// within the command's length, or -1 (no answer, cancelled, port closed).
int DialExchange(Link& link, const char* number, std::atomic<int>& cancel);
// "ATA": the final result of the reply, -1 when none came.
int AnswerCall(Link& link);
// "ATH": 1 when the card answered at all.
int HangUp(Link& link);
// "AT+VTS=c", only while the call list shows an active voice call: 1 on a reply.
int SendDtmf(Link& link, char c);

}  // namespace vqm
