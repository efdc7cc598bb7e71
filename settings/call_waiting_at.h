// Call waiting for voice calls through "+CCWA" (27.007): whether the network announces a
// second call during a call, and switching it on and off. The first parameter (1) also asks
// the card to present a waiting call with an unsolicited "+CCWA:" line.
#pragma once

#include <cstddef>

namespace vqm {

struct Link;

// The service class these commands are sent for: voice.
inline constexpr int kCallWaitingVoice = 1;

// What the query found.
inline constexpr int kWaitingActive = 1, kWaitingNotActive = 0, kWaitingUnknown = -1;

// "AT+CCWA=1,2,1": kWaitingActive or kWaitingNotActive, kWaitingUnknown when no reply came or it
// held no readable status line.
int QueryCallWaiting(Link& link);
// The query reply's scan on its own. Every "+CCWA: <status>[,<class>]" line that opens a line
// counts: a status of 1 whose class holds the voice bit (or that names no class) is active;
// otherwise a readable status line says not active; a line with another layout (a waiting
// caller's "+CCWA: \"<number>\",...") or a status other than 0 and 1 is passed over.
int ParseCallWaitingReply(const char* reply, int length);

// "AT+CCWA=1": only asks the card to present a waiting caller with a "+CCWA:" line (a standard
// modem starts with that off), without asking the network anything. The final result code, -1
// when no reply came.
int PresentCallWaiting(Link& link);

// "AT+CCWA=1,1,1" (enable != 0) or "AT+CCWA=1,0,1". The final result code, -1 when no reply came.
int SetCallWaiting(Link& link, int enable);

// The number of a waiting caller's line, "+CCWA: \"<number>\",<type>,<class>": the quoted field
// after the tag, with the '+' a type of 145 stands for put in front when the number lacks it.
// Writes at most numberSize - 1 bytes and a NUL; returns the length, 0 when the line holds no
// number (a status line, a withheld number, something else).
int ParseCallWaitingLine(const char* text, int length, char* number, size_t numberSize);

}  // namespace vqm
