// The card's own queries: identity and firmware, signal, operator, speaker volume, the call
// list, and the caller's number of a "+CLIP:" line.
//
// Names: a parser is Parse<Thing>Reply for the reply to a command (Parse<Thing>Line for an
// unsolicited line); it takes the reply's text and length, writes its fields into the caller's
// buffers and does no I/O, so every layout it reads is tested and fuzzed without a card. A
// wrapper is named for what it does, verb first (Get..., Set..., Query...): it sends the command
// over the link and hands the reply to its parser.
//
// The parsers read the card's own layouts exactly as the card writes them, and also the 3GPP
// 27.007 layouts that other modems use, where the card's reading would not understand them.
#pragma once

#include <cstddef>
#include <cstdint>
#include <string>

namespace vqm {

struct Link;

// The first line of information of a reply ("+GMI", "+GMM", "+GMR"): the line ends that open
// the reply are passed over and the text is cut at the next CR or LF. Writes it NUL-terminated
// within lineSize and returns its length (0 for an empty line).
int ParseIdentityReply(const char* reply, int length, char* line, size_t lineSize);

// The firmware version of a "+GMR" reply: the number after its first "SW" (so "SW2.01" gives
// 2.01); 0.0 when there is no "SW" or no number after it ("REV1" gives 0.0).
float ParseFirmwareReply(const char* reply, int length);

// Signal bars, 0 to 4, from "+CSQ: <q>,<ber>": q below 8 gives 0, below 16 gives 1, below 24
// gives 2, below 31 gives 3, anything else 4, so 99 ("not known") shows full strength as the
// card's own display does. A reply without "+CSQ: " gives 0 bars.
int ParseSignalReply(const char* reply, int length);

// The operator's name from a "+COPS?" reply, written NUL-terminated within nameSize; returns
// its length, or 0 when the operator is not known. Read in this order:
// - the card's form: the digits after the first ",2," found at offset 1 or later, looked up in
//   the operator table ("+COPS: 0,2,20205" is PANAFON);
// - a quoted numeric code ("+COPS: 0,2,\"23415\""), looked up in the same table;
// - an alphanumeric name ("+COPS: 0,0,\"Vodafone UK\""): the table's name when it knows the
//   name, else the modem's own name.
// "+COPS: 0" (no operator, or no format set yet) gives 0.
int ParseOperatorReply(const char* reply, int length, char* name, size_t nameSize);

// The speaker level from "+CLVL: <level>"; -1 when there is no "+CLVL:" or no number after it.
int ParseVolumeReply(const char* reply, int length);

// What a call-list reply says.
inline constexpr int kCallListCall = 1;      // a call is listed: its state and mode were read
inline constexpr int kCallListEmpty = 0;     // no call: a clean reply ending in OK, no "+CLCC:"
inline constexpr int kCallListUnknown = -1;  // cannot tell (damaged, ERROR, no final result)

// Reads an "AT+CLCC" reply line by line. kCallListCall with the state and mode of the first
// "+CLCC: <idx>,<dir>,<stat>,<mode>[,...]" line, which must be whole (a damaged one gives
// kCallListUnknown); when number is given, the line's quoted number goes there (empty when the
// line has none). kCallListEmpty only when the reply holds one "OK" line and every other line
// is blank, the command's echo (before the OK), or a printable unsolicited line that is not
// "+CLCC:" ("RING", "+CRING: VOICE", "+CMTI: ...", "*ECAV: ...", arriving meanwhile). Anything
// else (line noise, "ERROR", "+CME ERROR: <n>", no final result) is kCallListUnknown: noise must
// never read as "no call", which would end the call.
int ParseCallListReply(const char* reply, int length, int* state, int* mode,
                       std::string* number = nullptr);

// The caller's number of one "+CLIP:" line (the text starts with the tag). Firmware up to 3.81
// sends the number bare and later firmware quotes it; a line whose first field is quoted is read
// quoted whatever the version. A type field of 145 (international) puts in front the '+' the
// number lacks. Writes the number NUL-terminated within numberSize and returns its length; 0
// (an empty number) when the line is shorter than 7 bytes or holds no number.
int ParseCallerIdLine(const char* text, int length, float firmwareVersion, char* number,
                      size_t numberSize);

// The wrappers. The queries a poll makes (signal, volume, call list) and the start-up ones wait
// for a reply at most kQueryAnswerLimitMs, so a silent card never holds a caller for ever.

// "AT+GMR": the version (0.0 when unknown or no reply) and the reply's first line in text.
float GetFirmwareVersion(Link& link, char16_t* text, size_t textSize);
// "AT+GMI", "AT+GMM", then the firmware. 1, or 0 when a command gets no reply.
int GetCardIdentity(Link& link, char16_t* manufacturer, size_t manufacturerSize, char16_t* model,
                    size_t modelSize, char16_t* firmware, size_t firmwareSize);
// "AT+CSQ": 0 to 4 bars, -1 when the port was busy or the card silent. As a poll it gives up
// when the port is busy; the InTurn form waits for the port like any command.
int GetSignalBars(Link& link);
int GetSignalBarsInTurn(Link& link);
// "AT+COPS?": 1 with the name in UTF-16, or 0.
int GetOperatorName(Link& link, char16_t* name, size_t nameSize);
// "AT+CLVL?" (not waiting for a busy port): the level, or -1.
int GetSpeakerVolume(Link& link);
// "AT+CLVL=<level>": the final result of the reply, -1 when none came.
int SetSpeakerVolume(Link& link, int level);
// "AT+CLCC": kCallListCall with *state and *mode, kCallListEmpty, or kCallListUnknown (also when
// no reply came): "no reply" and "damaged" are never reported as "no call". number, when given,
// gets the listed call's number.
int QueryCallState(Link& link, int* state, int* mode, std::string* number = nullptr);

}  // namespace vqm
