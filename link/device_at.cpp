#include "link/device_at.h"

#include <cstdio>
#include <cstdlib>
#include <cstring>

#include "link/link.h"
#include "link/operators.h"
#include "support/field_cursor.h"
#include "support/text.h"

namespace vqm {

namespace {

constexpr size_t kReplySize = 256;

// Copies at most size - 1 bytes of the reply from offset at into out and NUL-terminates, so
// that the C library's number readers (which run to a NUL) stay inside the reply.
void CopyWindow(const char* reply, int length, int at, char* out, size_t size) {
    size_t n = static_cast<size_t>(length - at);
    if (n > size - 1) n = size - 1;
    std::memcpy(out, reply + at, n);
    out[n] = '\0';
}

bool IsPrintable(char c) {
    return c >= 0x20 && c <= 0x7E;
}

bool IsTagCharacter(char c) {
    return (c >= 'A' && c <= 'Z') || (c >= '0' && c <= '9');
}

// The kinds of line a call-list reply may hold.
enum class LineKind { kBlank, kEcho, kOk, kCallList, kUnsolicited, kOther };

LineKind Classify(const char* line, const char* end) {
    const size_t n = static_cast<size_t>(end - line);
    if (n == 0) return LineKind::kBlank;
    for (const char* p = line; p < end; ++p)
        if (!IsPrintable(*p)) return LineKind::kOther;
    if (n == 2 && std::memcmp(line, "OK", 2) == 0) return LineKind::kOk;
    if (n == 4 && std::memcmp(line, "RING", 4) == 0) return LineKind::kUnsolicited;
    if (n >= 6 && std::memcmp(line, "+CLCC:", 6) == 0) return LineKind::kCallList;
    if (n >= 2 && (line[0] == 'A' || line[0] == 'a') && (line[1] == 'T' || line[1] == 't'))
        return LineKind::kEcho;
    // "+CRING: VOICE", "+CMTI: ...", and vendor lines such as "*ECAV: ..." or "^RSSI: ...".
    if (line[0] != '+' && line[0] != '*' && line[0] != '^') return LineKind::kOther;
    const char* p = line + 1;
    while (p < end && IsTagCharacter(*p))
        ++p;
    return p > line + 1 && p < end && *p == ':' ? LineKind::kUnsolicited : LineKind::kOther;
}

// "<idx>,<dir>,<stat>,<mode>" after a "+CLCC:" tag, then the line's end or more fields.
bool ReadCallLine(FieldCursor& cursor, int* state, int* mode, std::string* number) {
    int32_t index = 0, direction = 0, callState = 0, callMode = 0;
    if (!(cursor.NextInt(&index) && cursor.Comma() && cursor.NextInt(&direction) &&
          cursor.Comma() && cursor.NextInt(&callState) && cursor.Comma() &&
          cursor.NextInt(&callMode)))
        return false;
    if (!cursor.AtLineEnd() && *cursor.Position() != ',') return false;
    if (state) *state = callState;
    if (mode) *mode = callMode;
    if (number) {
        // ",<mpty>,\"<number>\",<type>": the number is optional, and a damaged one is none.
        number->clear();
        int32_t multiparty = 0;
        char text[64];
        int length = 0;
        int32_t type = 0;
        if (cursor.Comma() && cursor.NextInt(&multiparty) && cursor.Comma() &&
            cursor.NextQuoted(text, sizeof text, &length) && length > 0) {
            // A type of 145 (international) puts in front the '+' the number may lack.
            if (cursor.Comma() && cursor.NextInt(&type) && type == 145 && text[0] != '+')
                number->push_back('+');
            number->append(text, static_cast<size_t>(length));
        }
    }
    return true;
}

// Fills a UTF-16 buffer with the first line of a reply.
void IdentityToWide(const char* reply, int length, char16_t* text, size_t textSize) {
    if (!text || textSize == 0) return;
    char line[kReplySize];
    const int n = ParseIdentityReply(reply, length, line, sizeof line);
    if (n > 0)
        NarrowToWide(line, text, n, textSize);
    else
        text[0] = u'\0';
}

// A periodic poll: it gives up at once when the port stays busy, and waits for the reply at
// most as long as any query.
unsigned PollCommand(Link& link, const char* command, char* reply, size_t replySize) {
    ExchangeOptions options;
    options.tryLock = true;
    options.answerLimitMs = kQueryAnswerLimitMs;
    return AtExchange(link, command, reply, replySize, options);
}

}  // namespace

int ParseIdentityReply(const char* reply, int length, char* line, size_t lineSize) {
    if (!line || lineSize == 0) return 0;
    line[0] = '\0';
    if (!reply || length <= 0) return 0;
    const char* end = reply + length;
    const char* p = reply;
    while (p < end && (*p == '\r' || *p == '\n'))
        ++p;
    const char* stop = p;
    while (stop < end && *stop != '\r' && *stop != '\n')
        ++stop;
    size_t n = static_cast<size_t>(stop - p);
    if (n > lineSize - 1) n = lineSize - 1;
    std::memcpy(line, p, n);
    line[n] = '\0';
    return static_cast<int>(n);
}

float ParseFirmwareReply(const char* reply, int length) {
    if (!reply || length <= 0) return 0.0f;
    const int at = FindPattern(0, "SW", 2, reply, length);
    if (at < 0) return 0.0f;
    char window[128];
    CopyWindow(reply, length, at, window, sizeof window);
    float version = 0.0f;
    if (std::sscanf(window, "SW%f", &version) != 1) version = 0.0f;
    return version;
}

int ParseSignalReply(const char* reply, int length) {
    FieldCursor cursor(reply, length);
    int32_t quality = 0;
    if (cursor.SeekPast("+CSQ: ")) {
        cursor.SkipSpace();
        if (!cursor.NextInt(&quality)) quality = 0;
    }
    // 99 means "not known"; it shows as full strength, as the card's own display does.
    if (quality < 8) return 0;
    if (quality < 16) return 1;
    if (quality < 24) return 2;
    if (quality < 31) return 3;
    return 4;
}

int ParseOperatorReply(const char* reply, int length, char* name, size_t nameSize) {
    if (!name || nameSize == 0) return 0;
    name[0] = '\0';
    if (!reply || length <= 0) return 0;

    // The card's form: the digits right after ",2,", read the way atoi reads them.
    const int at = FindPattern(0, ",2,", 3, reply, length);
    if (at >= 1) {
        char window[32];
        CopyWindow(reply, length, at + 3, window, sizeof window);
        const auto code = static_cast<uint32_t>(static_cast<int>(std::strtol(window, nullptr, 10)));
        const int n = OperatorNameByCode(code, name, nameSize);
        if (n > 0) return n;
    }

    // The standard form: "+COPS: <mode>[,<format>,\"<oper>\"[,<act>]]".
    FieldCursor cursor(reply, length);
    int32_t mode = 0, format = -1;
    char oper[64];
    int operLength = 0;
    if (!(cursor.NextTag("+COPS:") && cursor.NextInt(&mode) && cursor.Comma() &&
          cursor.NextInt(&format) && cursor.Comma() &&
          cursor.NextQuoted(oper, sizeof oper, &operLength)) ||
        operLength == 0)
        return 0;
    if (format == 2) {
        uint32_t code = 0;
        for (int i = 0; i < operLength; ++i) {
            if (oper[i] < '0' || oper[i] > '9' || i >= 9) return 0;
            code = code * 10 + static_cast<uint32_t>(oper[i] - '0');
        }
        return OperatorNameByCode(code, name, nameSize);
    }
    if (format != 0 && format != 1) return 0;
    // The modem names the network itself; the table's spelling of the same name is no better.
    size_t n = static_cast<size_t>(operLength);
    if (n > nameSize - 1) n = nameSize - 1;
    std::memcpy(name, oper, n);
    name[n] = '\0';
    return static_cast<int>(n);
}

int ParseVolumeReply(const char* reply, int length) {
    FieldCursor cursor(reply, length);
    int32_t level = -1;
    return cursor.SeekPast("+CLVL:") && cursor.NextInt(&level) ? level : -1;
}

int ParseCallListReply(const char* reply, int length, int* state, int* mode, std::string* number) {
    FieldCursor cursor(reply, length);
    if (cursor.AtEnd()) return kCallListUnknown;
    bool ok = false;
    do {
        const char* line = cursor.Position();
        const char* end = line;
        while (end < cursor.End() && *end != '\r' && *end != '\n')
            ++end;
        switch (Classify(line, end)) {
            case LineKind::kCallList: {
                FieldCursor fields(line, end);
                if (fields.NextTag("+CLCC:") && ReadCallLine(fields, state, mode, number))
                    return kCallListCall;
                // A damaged record: a call may well be there.
                return kCallListUnknown;
            }
            case LineKind::kOk:
                if (ok) return kCallListUnknown;
                ok = true;
                break;
            case LineKind::kEcho:
                if (ok) return kCallListUnknown;
                break;
            case LineKind::kBlank:
            case LineKind::kUnsolicited:
                break;
            case LineKind::kOther:
                return kCallListUnknown;
        }
    } while (cursor.NextLine());
    return ok ? kCallListEmpty : kCallListUnknown;
}

int ParseCallerIdLine(const char* text, int length, float firmwareVersion, char* number,
                      size_t numberSize) {
    if (!number || numberSize == 0) return 0;
    number[0] = '\0';
    if (!text || length < 7) return 0;
    FieldCursor cursor(text, length);
    if (!cursor.NextTag("+CLIP:")) return 0;
    cursor.SkipSpace();

    // Read into a buffer with room for the '+' that a type of 145 may add in front.
    char digits[64];
    int n = 0;
    bool read = false;
    if (!cursor.AtEnd() && *cursor.Position() == '"')
        read = cursor.NextQuoted(digits, sizeof digits, &n);
    if (!read) {
        read = firmwareVersion <= 3.81f ? cursor.NextNumber(digits, sizeof digits, &n)
                                        : cursor.SeekQuoted(digits, sizeof digits, &n);
    }
    if (!read || n == 0) return 0;

    int32_t type = 0;
    const bool international = cursor.Comma() && cursor.NextInt(&type) && type == 145;
    const char* from = digits;
    size_t out = 0;
    if (international && digits[0] != '+' && numberSize > 1) number[out++] = '+';
    while (*from && out + 1 < numberSize)
        number[out++] = *from++;
    number[out] = '\0';
    return static_cast<int>(out);
}

float GetFirmwareVersion(Link& link, char16_t* text, size_t textSize) {
    char reply[kReplySize];
    const int length = static_cast<int>(
        AtCommandWithin(link, "AT+GMR\r", reply, sizeof reply, kQueryAnswerLimitMs));
    if (length == 0) return 0.0f;
    IdentityToWide(reply, length, text, textSize);
    return ParseFirmwareReply(reply, length);
}

int GetCardIdentity(Link& link, char16_t* manufacturer, size_t manufacturerSize, char16_t* model,
                    size_t modelSize, char16_t* firmware, size_t firmwareSize) {
    char reply[kReplySize];
    int length = static_cast<int>(
        AtCommandWithin(link, "AT+GMI\r", reply, sizeof reply, kQueryAnswerLimitMs));
    if (length == 0) return 0;
    IdentityToWide(reply, length, manufacturer, manufacturerSize);
    length = static_cast<int>(
        AtCommandWithin(link, "AT+GMM\r", reply, sizeof reply, kQueryAnswerLimitMs));
    if (length == 0) return 0;
    IdentityToWide(reply, length, model, modelSize);
    GetFirmwareVersion(link, firmware, firmwareSize);
    return 1;
}

int GetSignalBars(Link& link) {
    char reply[kReplySize];
    const int length = static_cast<int>(PollCommand(link, "AT+CSQ\r", reply, sizeof reply));
    return length == 0 ? -1 : ParseSignalReply(reply, length);
}

int GetSignalBarsInTurn(Link& link) {
    char reply[kReplySize];
    const int length = static_cast<int>(
        AtCommandWithin(link, "AT+CSQ\r", reply, sizeof reply, kQueryAnswerLimitMs));
    return length == 0 ? -1 : ParseSignalReply(reply, length);
}

int GetOperatorName(Link& link, char16_t* name, size_t nameSize) {
    char reply[kReplySize];
    const int length = static_cast<int>(
        AtCommandWithin(link, "AT+COPS?\r", reply, sizeof reply, kQueryAnswerLimitMs));
    if (length == 0) return 0;
    char narrow[64];
    const int n = ParseOperatorReply(reply, length, narrow, sizeof narrow);
    if (n <= 0) return 0;
    NarrowToWide(narrow, name, n, nameSize);
    return 1;
}

int GetSpeakerVolume(Link& link) {
    char reply[kReplySize];
    const int length = static_cast<int>(PollCommand(link, "AT+CLVL?\r", reply, sizeof reply));
    return length == 0 ? -1 : ParseVolumeReply(reply, length);
}

int SetSpeakerVolume(Link& link, int level) {
    char command[32], reply[kReplySize];
    std::snprintf(command, sizeof command, "AT+CLVL=%d\r", level);
    const int length =
        static_cast<int>(AtCommandWithin(link, command, reply, sizeof reply, kQueryAnswerLimitMs));
    return length == 0 ? -1 : AtFinalResult(reply, length);
}

int QueryCallState(Link& link, int* state, int* mode, std::string* number) {
    char reply[kReplySize];
    const int length = static_cast<int>(
        AtCommandWithin(link, "AT+CLCC\r", reply, sizeof reply, kQueryAnswerLimitMs));
    return length == 0 ? kCallListUnknown : ParseCallListReply(reply, length, state, mode, number);
}

}  // namespace vqm
