// The network selection commands: the registered operator, automatic or manual selection, the
// search for available networks and registration with one of them. The card reports operators
// by numeric code only; names come from the operator table (link/operators.h).
#pragma once

#include <cstddef>
#include <cstdint>

namespace vqm {

struct Link;

// Operator names as the Network page lists them: 32 UTF-16 units, NUL included.
inline constexpr size_t kOperatorNameSize = 32;
using OperatorName = char16_t[kOperatorNameSize];

// "AT+COPS?": 1 with the registered operator's name in name; 0 when there is no reply or the
// code is not in the table (a quoted or alphanumeric answer gives code 0), leaving name alone.
int CurrentOperatorName(Link& link, char16_t* name, size_t nameSize);

// "AT+COPS?": the selection mode after "+COPS:" (0 automatic, 1 manual); -1 when there is no
// reply or no "+COPS:" in it.
int NetworkMode(Link& link);
int ParseNetworkMode(const char* reply, int length);

// "AT+COPS=0": the final result code, -1 when there is no reply.
int NetworkAutomatic(Link& link);

// "AT+COPS=1,2,<code>" with the code of the first table entry named name: the final result
// code; -1 when the name is not in the table (nothing is sent) or there is no reply.
int NetworkRegister(Link& link, const char16_t* name);

// "AT+COPS=?": fills names (at most maxNames) with the networks found, in reply order, and
// *count with their number; returns 1, or -1 when there is no reply or no "+COPS:" in it.
int NetworkSearch(Link& link, OperatorName* names, int maxNames, int* count);

// The search reply's scan on its own. Entries are read with a fixed stride of 10 characters
// from 7 after "+COPS:", each "<status>,,,<code>,"; the layout "+COPS: 2,,,20201,1,,,20205," is
// what the card sends, and brackets or quotes are not looked for. A code missing from the table
// repeats the name before it (the first such entry shows the code's digits) and still counts.
//
// A standard 27.007 modem answers "+COPS: (2,\"Long\",\"Short\",\"20201\"),(1,...),,(0,1,2),(2)":
// each bracketed entry is read for its numeric code, named from the table when the code is
// there and by the modem's own long (else short) name when not. codes, when given, gets each
// entry's code (-1 when the reply gave none) so that a network the table cannot name can still
// be registered.
int ParseOperatorSearch(const char* reply, int length, OperatorName* names, int maxNames,
                        int* count, int32_t* codes = nullptr);

// As NetworkSearch, with each entry's code as ParseOperatorSearch gives it.
int NetworkSearchCodes(Link& link, OperatorName* names, int32_t* codes, int maxNames, int* count);

// As NetworkRegister; a name the table does not hold registers fallbackCode instead when it is
// a code (a network named by the modem itself). -1 when neither gives a code.
int NetworkRegisterListed(Link& link, const char16_t* name, int32_t fallbackCode);

}  // namespace vqm
