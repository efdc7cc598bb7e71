#include "messaging/sms_at.h"

#include <cstdio>
#include <cstring>

#include "link/link.h"
#include "support/field_cursor.h"
#include "support/gsm.h"
#include "support/text.h"

namespace vqm {

namespace {

constexpr char kCtrlZ = 0x1A;
constexpr size_t kReplySize = 256;

// The message commands work on the SIM, which answers at once; some run on the window's
// thread, so a card that does not answer holds it only this long. Sending (the text after its
// prompt, and a stored message) is a network operation and waits longer.
constexpr int kSimAnswerLimitMs = 3000;
constexpr int kSendAnswerLimitMs = 60000;

int Exchange(Link& link, const char* command, char* reply, size_t replySize) {
    const bool sending = std::strncmp(command, "AT+CMSS", 7) == 0;
    return static_cast<int>(AtCommandWithin(link, command, reply, replySize,
                                            sending ? kSendAnswerLimitMs : kSimAnswerLimitMs));
}

// Cards put a blank behind the colon of a reply tag; the fields start after it.
bool HasError(const char* reply, int length) {
    return FindPattern(0, "ERROR", 5, reply, length) >= 0;
}

void CopyBounded(char* out, size_t outSize, const char* text) {
    std::snprintf(out, outSize, "%s", text);
}

const char* StatusWord(int stat) {
    switch (stat) {
        case 0:
            return "REC UNREAD";
        case 1:
            return "REC READ";
        case 2:
            return "STO UNSENT";
        default:
            return "";  // a stored sent message (3) is not named by the read
    }
}

// Sends the command that asks for a prompt, then the body ended by Ctrl-Z; the reply to the
// body goes into reply. 0 when either got no reply or no prompt came.
int PromptAndBody(Link& link, const char* command, char* body, size_t bodyLength, size_t bodySize,
                  char* reply, size_t replySize) {
    if (bodyLength + 2 > bodySize) return 0;
    body[bodyLength] = kCtrlZ;
    body[bodyLength + 1] = '\0';
    // The port stays ours from the command to the text: anything sent between would be taken
    // into the message.
    if (!PortLock(link)) return 0;
    ExchangeOptions held;
    held.lockHeld = true;
    held.answerLimitMs = kSendAnswerLimitMs;
    int length = static_cast<int>(AtExchange(link, command, reply, replySize, held));
    if (length > 0 && FindPattern(0, ">", 1, reply, length) >= 0)
        length = static_cast<int>(AtExchange(link, body, reply, replySize, held));
    else
        length = 0;
    PortUnlock(link);
    return length;
}

// "AT+CMGW" and "AT+CMGS" in PDU mode differ only in the command and the confirmation.
int SendPduWithPrompt(Link& link, const char* commandFormat, SmsRecord* record, char* reply,
                      size_t replySize, int* replyLength) {
    char pdu[kSmsPduCommandSize];
    const int octets = BuildSubmitPdu(*record, pdu, sizeof pdu - 1);  // room for Ctrl-Z
    if (octets == 0) return 0;
    char command[32];
    std::snprintf(command, sizeof command, commandFormat, octets);
    *replyLength =
        PromptAndBody(link, command, pdu, std::strlen(pdu), sizeof pdu, reply, replySize);
    return *replyLength > 0;
}

// Same for text mode: the record's text in the GSM alphabet straight into the command buffer.
int SendTextWithPrompt(Link& link, const char* command, SmsRecord* record, char* reply,
                       size_t replySize, int* replyLength) {
    char body[kSmsPduCommandSize];
    int count = record->length < 0 ? 0 : record->length;
    if (count > static_cast<int>(sizeof record->text)) count = sizeof record->text;
    const int written = TextToGsm(record->text, count, body, sizeof body - 2);
    *replyLength = PromptAndBody(link, command, body, static_cast<size_t>(written), sizeof body,
                                 reply, replySize);
    return *replyLength > 0;
}

void AfterWrite(SmsRecord* record, const char* reply, int length) {
    CopyBounded(record->status, sizeof record->status, "STO UNSENT");
    record->date[0] = '\0';
    FieldCursor c(reply, length);
    int32_t index;
    if (c.NextTag("+CMGW:") && c.NextInt(&index)) record->index = index;
}

// "yy/MM/dd,hh:mm:ss+zz" as hh:mm:ss,dd/MM/20yy; a field of another shape stays as it came.
void ReorderTextDate(char* date, size_t dateSize) {
    if (std::strlen(date) < 17 || date[2] != '/' || date[5] != '/' || date[8] != ',') return;
    char ordered[20];
    std::snprintf(ordered, sizeof ordered, "%.8s,%.2s/%.2s/20%.2s", date + 9, date + 6, date + 3,
                  date);
    CopyBounded(date, dateSize, ordered);
}

}  // namespace

int SmsGetCentre(Link& link, char16_t* centre, size_t centreSize, int32_t* validity) {
    char reply[kReplySize];
    int length = Exchange(link, "AT+CSCA?\r", reply, sizeof reply);
    if (length == 0) return 0;
    if (FieldCursor c(reply, length); c.NextTag("+CSCA:") && centre && centreSize > 0) {
        char number[64];
        int numberLength = 0;
        if (c.SeekQuoted(number, sizeof number, &numberLength) && numberLength >= 1)
            NarrowToWide(number, centre, numberLength, centreSize);
        else
            centre[0] = u'\0';
    }
    length = Exchange(link, "AT+CSMP?\r", reply, sizeof reply);
    if (length == 0) return 0;
    FieldCursor c(reply, length);
    if (!c.NextTag("+CSMP:") || !validity) return 1;
    // <fo> and <vp> land in the one output on purpose: only <vp> is wanted.
    if (!c.NextInt(validity) || !c.Comma()) {
        *validity = 0;
        return 1;
    }
    c.NextInt(validity);
    return 1;
}

int SmsSetCentre(Link& link, const char16_t* centre, int parameter) {
    char number[64];
    const int count = centre ? static_cast<int>(WideLength(centre, sizeof number - 1)) : 0;
    WideToNarrow(centre ? centre : u"", number, count, sizeof number);
    char command[96], reply[kReplySize];
    std::snprintf(command, sizeof command, "AT+CSCA=\"%s\"\r", number);
    int length = Exchange(link, command, reply, sizeof reply);
    if (length == 0 || HasError(reply, length)) return 0;
    std::snprintf(command, sizeof command, "AT+CSMP=%d\r", parameter);
    length = Exchange(link, command, reply, sizeof reply);
    if (length == 0) return 0;
    return HasError(reply, length) ? 0 : 1;
}

int SmsSelectSimStorage(Link& link, int32_t* used, int32_t* total) {
    char reply[kReplySize];
    const int length = Exchange(link, "AT+CPMS=\"SM\",\"SM\",\"SM\"\r", reply, sizeof reply);
    if (length == 0) return 0;
    FieldCursor c(reply, length);
    int32_t ignored;
    if (!c.NextTag("+CPMS:") || !c.NextInt(used ? used : &ignored) || !c.Comma()) return 0;
    return c.NextInt(total ? total : &ignored);
}

int SmsStorageUsed(Link& link) {
    char reply[kReplySize];
    const int length = Exchange(link, "AT+CPMS?\r", reply, sizeof reply);
    if (length == 0) return -1;
    const int at = FindPattern(0, "\"SM\",", 5, reply, length);
    if (at < 1) return -1;  // a reply that opens with the memory name is not a "+CPMS:" line
    int32_t used;
    return ParseInt(reply + at + 5, reply + length, &used) ? used : -1;
}

int SmsStorageFull(Link& link) {
    int32_t used = 0, total = 0;
    if (!SmsSelectSimStorage(link, &used, &total)) return 0;
    return used == total ? 1 : 0;
}

namespace {

// Octets of the validity period an SMS-SUBMIT carries, by the first octet's format bits:
// none, enhanced (7), relative (1) or absolute (7).
int ValidityOctets(int firstOctet) {
    static constexpr int kOctets[4] = {0, 7, 1, 7};
    return kOctets[(firstOctet >> 3) & 3];
}

// The user-data header's concatenation element (8- or 16-bit reference), if it has one.
void ReadPartHeader(const char* header, const char* headerEnd, SmsPartInfo* part) {
    for (const char* p = header; p + 4 <= headerEnd;) {
        const int id = HexToInt(p, headerEnd, 2);
        const int size = HexToInt(p + 2, headerEnd, 2);
        if (id < 0 || size < 0 || p + 4 + size * 2 > headerEnd) return;
        const char* data = p + 4;
        if (id == 0x00 && size == 3) {
            *part = {HexToInt(data, headerEnd, 2), HexToInt(data + 2, headerEnd, 2),
                     HexToInt(data + 4, headerEnd, 2)};
        } else if (id == 0x08 && size == 4) {
            *part = {HexToInt(data, headerEnd, 4), HexToInt(data + 4, headerEnd, 2),
                     HexToInt(data + 6, headerEnd, 2)};
        }
        p = data + size * 2;
    }
}

}  // namespace

// Everything behind the originator: PID, DCS, time stamp or validity period, user data.
int ParseAfterAddress(const char* pdu, const char* pduEnd, long at, int firstOctet, int stat,
                      SmsRecord* record) {
    auto octet = [&](long position) {
        return position < 0 || position > pduEnd - pdu ? -1 : HexToInt(pdu + position, pduEnd, 2);
    };
    const int coding = octet(at + 2);  // behind the protocol identifier
    if (coding < 0) return 0;
    record->coding = coding;
    if (stat == 2) {
        // PID, DCS and the validity period in the format the first octet names.
        at += 4 + ValidityOctets(firstOctet) * 2L;
    } else {
        const long stampAt = at + 4;
        if (stampAt + 14 > pduEnd - pdu) return 0;
        const char* s = pdu + stampAt;
        // Each octet has its two digits swapped: year, month, day, hour, minute, second, zone.
        std::snprintf(record->date, sizeof record->date, "%c%c:%c%c:%c%c,%c%c/%c%c/20%c%c", s[7],
                      s[6], s[9], s[8], s[11], s[10], s[5], s[4], s[3], s[2], s[1], s[0]);
        at += 18;
    }

    const int userDataLength = octet(at);
    if (userDataLength < 0) return 0;
    const char* userData = pdu + at + 2;
    if (userData > pduEnd) return 0;
    const int userDataChars = static_cast<int>(pduEnd - userData);
    const bool septets = coding == 0 || coding == 0xF2;
    // A PDU shorter than its user-data length says is damaged: rejected, not shown as garbage.
    const long needed = septets ? (userDataLength * 7L + 7) / 8 : userDataLength;
    if (userDataChars < needed * 2) return 0;
    // A user-data header (concatenation, ports) is not text: its octets are passed over.
    long headerOctets = 0;
    if (firstOctet & 0x40) {
        const int headerLength = octet(at + 2);
        if (headerLength < 0 || headerLength + 1 > needed) return 0;
        headerOctets = headerLength + 1;
        SmsPartInfo part{};
        ReadPartHeader(userData + 2, userData + headerOctets * 2, &part);
        if (part.total > 1 && part.sequence >= 1) SmsSetPart(record, part);
    }
    if (coding == 8) {
        const int available = static_cast<int>(needed * 2 - headerOctets * 2);
        const int limit = static_cast<int>(sizeof record->text) - kSmsPartTrailer - 1;
        const int count = available < limit ? available : limit;
        std::memcpy(record->text, userData + headerOctets * 2, static_cast<size_t>(count));
        record->text[count] = '\0';
        record->length = count;
    } else if (septets) {
        char codes[sizeof record->text];
        const int all = UnpackSeptets(userData, userDataChars, codes, sizeof codes, userDataLength);
        // The text starts at the first septet boundary behind the header.
        const int skip = static_cast<int>((headerOctets * 8 + 6) / 7);
        int count = all > skip ? all - skip : 0;
        const int limit = static_cast<int>(sizeof record->text) - kSmsPartTrailer - 1;
        if (count > limit) count = limit;
        std::memcpy(record->text, codes + skip, static_cast<size_t>(count));
        record->text[count] = '\0';
        record->length = count;
        for (int i = 0; i < count; ++i)
            record->text[i] = SmsCodeToText(static_cast<uint8_t>(record->text[i]));
    } else {
        CopyBounded(record->text, sizeof record->text, "DATA MESSAGE");
        record->length = 12;
    }
    return 1;
}

int SmsParsePduReply(const char* reply, int length, SmsRecord* record) {
    if (!reply || length <= 0 || !record) return 0;
    const char* end = reply + length;
    FieldCursor c(reply, length);
    if (!c.NextTag("+CMGR:")) return 0;
    int32_t stat = -1;
    const bool statRead = c.NextInt(&stat);
    if (statRead) CopyBounded(record->status, sizeof record->status, StatusWord(stat));
    if (!statRead || !c.Comma()) return 0;
    c.Comma();  // empty alpha field
    int32_t pduLength;
    if (!c.NextInt(&pduLength)) return 0;
    const char* pdu = c.Position() + 2;  // behind the "\r\n" that ends the header line
    if (pdu > end) return 0;
    // The PDU, and with it every field below, ends at the first line end.
    const char* pduEnd = pdu;
    while (pduEnd < end && *pduEnd != '\r' && *pduEnd != '\n')
        ++pduEnd;
    auto octet = [&](long position) {
        return position < 0 || position > pduEnd - pdu ? -1 : HexToInt(pdu + position, pduEnd, 2);
    };

    const int centreLength = octet(0);
    if (centreLength < 0) return 0;
    const long firstOctetAt = centreLength == 0 ? 2 : (centreLength + 1) * 2L;
    const int firstOctet = octet(firstOctetAt);
    if (firstOctet < 0) return 0;
    long at = firstOctetAt + 2;
    if ((firstOctet & 0x03) != 0 || stat == 2) at += 2;  // the message reference

    const int digits = octet(at);
    const int addressType = octet(at + 2);
    if (digits < 0 || addressType < 0) return 0;
    const long fieldLength = (digits + 1) / 2 * 2L;
    const long fieldAt = at + 4;
    if (fieldAt + fieldLength > pduEnd - pdu) return 0;
    const size_t numberUsed = strnlen(record->number, sizeof record->number);
    if ((addressType & 0x70) == 0x50) {
        // An alphanumeric sender (a bank's or an operator's name): its semi-octets are packed
        // 7-bit characters, read as the name they spell.
        char codes[24];
        const int count = UnpackSeptets(pdu + fieldAt, static_cast<int>(fieldLength), codes,
                                        sizeof codes, digits * 4 / 7);
        size_t n = numberUsed;
        for (int i = 0; i < count && n + 1 < sizeof record->number; ++i) {
            const int latin = GsmCodeToLatin(static_cast<uint8_t>(codes[i]));
            record->number[n++] = static_cast<char>(latin > 0 ? latin : '?');
        }
        if (n < sizeof record->number) record->number[n] = '\0';
        at = fieldAt + fieldLength;
        return ParseAfterAddress(pdu, pduEnd, at, firstOctet, stat, record);
    }
    char field[34], swapped[34];
    const long copied = fieldLength < 32 ? fieldLength : 32;
    std::memcpy(field, pdu + fieldAt, static_cast<size_t>(copied));
    field[copied] = '\0';
    PhoneToSemiOctets(field, swapped, sizeof swapped);
    size_t swappedLength = std::strlen(swapped);
    if (swappedLength > 0 &&
        (swapped[swappedLength - 1] == 'F' || swapped[swappedLength - 1] == 'f'))
        swapped[--swappedLength] = '\0';
    // Appended, as the record comes zero-filled; never past the field's end.
    if (numberUsed < sizeof record->number)
        std::snprintf(record->number + numberUsed, sizeof record->number - numberUsed, "%s%s",
                      addressType == 0x91 ? "+" : "", swapped);
    at = fieldAt + fieldLength;
    return ParseAfterAddress(pdu, pduEnd, at, firstOctet, stat, record);
}

int SmsParseTextReply(const char* reply, int length, SmsRecord* record) {
    if (!reply || length <= 0 || !record) return 0;
    FieldCursor c(reply, length);
    if (!c.NextTag("+CMGR:") || !c.SeekQuoted(record->status, sizeof record->status, nullptr) ||
        !c.Comma() || !c.SeekQuoted(record->number, sizeof record->number, nullptr) || !c.Comma())
        return 0;
    // Behind an empty alpha field, the time stamp.
    if (c.Comma()) {
        if (!c.SeekQuoted(record->date, sizeof record->date, nullptr)) return 0;
        ReorderTextDate(record->date, sizeof record->date);
    }
    const long bodyAt = (c.Position() - reply) + 2;
    const int okAt = FindPattern(0, "\r\nOK\r\n", 6, reply, length);
    if (okAt < 1) return 0;
    long count = okAt - bodyAt;
    if (count < 0) count = 0;
    if (count > 639) count = 639;
    std::memcpy(record->text, reply + bodyAt, static_cast<size_t>(count));
    record->text[count] = '\0';
    record->length = static_cast<int32_t>(count);
    record->coding = 0;
    return 1;
}

int SmsRead(Link& link, int mode, SmsRecord* record) {
    if ((mode != kSmsModePdu && mode != kSmsModeText) || !record) return 0;
    char command[32], reply[kSmsReadReplySize];
    std::snprintf(command, sizeof command, "AT+CMGR=%d\r", record->index);
    const int length = Exchange(link, command, reply, sizeof reply);
    if (length == 0) return 0;
    return mode == kSmsModePdu ? SmsParsePduReply(reply, length, record)
                               : SmsParseTextReply(reply, length, record);
}

int SmsWrite(Link& link, int mode, SmsRecord* record) {
    if ((mode != kSmsModePdu && mode != kSmsModeText) || !record) return 0;
    char reply[kReplySize];
    int length = 0;
    if (mode == kSmsModePdu) {
        if (!SendPduWithPrompt(link, "AT+CMGW=%d,2\r", record, reply, sizeof reply, &length))
            return 0;
    } else {
        char command[48];
        std::snprintf(command, sizeof command, "AT+CMGW=\"%.20s\"\r", record->number);
        if (!SendTextWithPrompt(link, command, record, reply, sizeof reply, &length)) return 0;
    }
    if (FindPattern(0, "+CMGW:", 6, reply, length) < 0) return 0;
    AfterWrite(record, reply, length);
    return 1;
}

int SmsSend(Link& link, int mode, SmsRecord* record) {
    if ((mode != kSmsModePdu && mode != kSmsModeText) || !record) return 0;
    char reply[kReplySize];
    int length = 0;
    if (mode == kSmsModePdu) {
        if (!SendPduWithPrompt(link, "AT+CMGS=%d\r", record, reply, sizeof reply, &length))
            return 0;
    } else {
        char command[48];
        std::snprintf(command, sizeof command, "AT+CMGS=\"%.20s\",%d\r", record->number,
                      record->number[0] == '+' ? 145 : 129);
        if (!SendTextWithPrompt(link, command, record, reply, sizeof reply, &length)) return 0;
    }
    if (FindPattern(0, "+CMGS:", 6, reply, length) < 0) return 0;
    CopyBounded(record->status, sizeof record->status, "STO SENT");
    return 1;
}

int SmsSendStored(Link& link, int index) {
    char command[32], reply[kReplySize];
    std::snprintf(command, sizeof command, "AT+CMSS=%d\r", index);
    const int length = Exchange(link, command, reply, sizeof reply);
    return length > 0 && FindPattern(0, "+CMSS:", 6, reply, length) >= 0 ? 1 : 0;
}

int SmsDelete(Link& link, int index) {
    char command[32], reply[kReplySize];
    std::snprintf(command, sizeof command, "AT+CMGD=%d\r", index);
    const int length = Exchange(link, command, reply, sizeof reply);
    return length == 0 ? -1 : AtFinalResult(reply, length);
}

int SmsGetFormat(Link& link) {
    char reply[kReplySize];
    const int length = Exchange(link, "AT+CMGF?\r", reply, sizeof reply);
    if (length == 0) return -1;
    FieldCursor c(reply, length);
    int32_t mode;
    return c.NextTag("+CMGF:") && c.NextInt(&mode) ? mode : -1;
}

int SmsSetFormat(Link& link, int mode) {
    char command[32], reply[kReplySize];
    std::snprintf(command, sizeof command, "AT+CMGF=%d\r", mode);
    const int length = Exchange(link, command, reply, sizeof reply);
    return length == 0 ? -1 : AtFinalResult(reply, length);
}

int SmsSetCharset(Link& link, const char* name) {
    char command[64], reply[kReplySize];
    std::snprintf(command, sizeof command, "AT+CSCS=\"%s\"\r", name ? name : "");
    const int length = Exchange(link, command, reply, sizeof reply);
    return length == 0 ? -1 : AtFinalResult(reply, length);
}

int PhoneToSemiOctets(const char* number, char* out, size_t outSize) {
    if (!out || outSize == 0) return 0;
    out[0] = '\0';
    if (!number) return 0;
    if (*number == '+') ++number;
    size_t count = strnlen(number, 32);
    // Keep room for the pad and the NUL.
    while (count > 0 && count + (count & 1) + 1 > outSize)
        --count;
    std::memcpy(out, number, count);
    size_t written = count;
    if (written & 1) out[written++] = 'F';
    for (size_t i = 0; i + 1 < written; i += 2) {
        const char first = out[i];
        out[i] = out[i + 1];
        out[i + 1] = first;
    }
    out[written] = '\0';
    return static_cast<int>(count);
}

int BuildSubmitPdu(const SmsRecord& record, char* out, size_t outSize) {
    if (!out || outSize == 0) return 0;
    out[0] = '\0';
    char number[sizeof record.number + 1];
    std::memcpy(number, record.number, sizeof record.number);
    number[sizeof record.number] = '\0';
    char digits[40];
    const int digitCount = PhoneToSemiOctets(number, digits, sizeof digits);
    const bool ucs2 = record.coding == 8;
    // The validity period is always 0xA7 (24 hours), whatever the centre settings say.
    int used = std::snprintf(out, outSize, "001100%02X%s%s00%sA7%02X", digitCount & 0xFF,
                             number[0] == '+' ? "91" : "81", digits, ucs2 ? "08" : "00",
                             (ucs2 ? record.length / 2 : record.length) & 0xFF);
    if (used < 0 || static_cast<size_t>(used) >= outSize) {
        out[0] = '\0';
        return 0;
    }
    char text[sizeof record.text + 1];
    std::memcpy(text, record.text, sizeof record.text);
    text[sizeof record.text] = '\0';
    if (ucs2) {
        const size_t count = std::strlen(text);
        if (used + count + 1 > outSize) {
            out[0] = '\0';
            return 0;
        }
        std::memcpy(out + used, text, count + 1);
        used += static_cast<int>(count);
    } else if (text[0] != '\0') {
        const int packed = PackSeptets(text, out + used, outSize - static_cast<size_t>(used));
        if (packed == 0) {
            out[0] = '\0';
            return 0;
        }
        used += packed;
    }
    return used / 2 - 1;
}

}  // namespace vqm

namespace vqm {

bool SmsPartOf(const SmsRecord& record, SmsPartInfo* part) {
    const char* t = record.text + sizeof record.text - kSmsPartTrailer;
    if (t[-1] != '\0' || t[0] != kSmsPartMark) return false;
    const auto byte = [&](int i) { return static_cast<uint8_t>(t[i]); };
    *part = {byte(1) | byte(2) << 8, byte(3), byte(4)};
    return part->total > 1 && part->sequence >= 1;
}

void SmsSetPart(SmsRecord* record, const SmsPartInfo& part) {
    char* t = record->text + sizeof record->text - kSmsPartTrailer;
    t[-1] = '\0';
    t[0] = kSmsPartMark;
    t[1] = static_cast<char>(part.reference & 0xFF);
    t[2] = static_cast<char>((part.reference >> 8) & 0xFF);
    t[3] = static_cast<char>(part.total);
    t[4] = static_cast<char>(part.sequence);
}

}  // namespace vqm

namespace vqm {

char SmsCodeToText(uint8_t code) {
    // The three codes that would otherwise show as blanks or odd marks.
    if (code == 0x00) return 0x20;
    if (code == 0x02) return 0x24;
    if (code == 0x0E) return 0x5D;
    const int latin = GsmCodeToLatin(code);
    return static_cast<char>(latin >= 0 ? latin : code);
}

char16_t SmsTextToWide(char byte) {
    const uint8_t b = static_cast<uint8_t>(byte);
    if (b == 0x10 || (b >= 0x12 && b <= 0x1A)) return GsmCodeToWide(b);
    if (b == 0x1B) return u' ';
    return LatinToWide(byte);
}

}  // namespace vqm
