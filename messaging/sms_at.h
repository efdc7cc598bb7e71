// Short messages over the card's AT commands (27.005): message memory, format, centre and
// submit parameters, and reading, writing, sending and deleting messages on the SIM. Every
// operation is one command (or a command and the body that follows its "> " prompt) through
// AtCommand; none keeps state. Mode 0 is PDU mode, mode 1 text mode; the program always works
// in PDU mode, the text forms are kept complete for cards that need them.
#pragma once

#include <bit>
#include <cstddef>
#include <cstdint>

namespace vqm {

struct Link;

// One short message, the record of the message files: 704 bytes, little-endian integers,
// written as it stands.
struct SmsRecord {
    int32_t index;    // SIM location, 1-based
    int32_t coding;   // the TP-DCS octet: 0 GSM 7-bit, 8 UCS2, anything else data
    int32_t length;   // septets for 7-bit, hexadecimal digits for UCS2
    char number[20];  // originator or destination; "+" opens an international number
    char status[12];  // "REC UNREAD", "REC READ", "STO UNSENT", "STO SENT" or empty
    char date[20];    // hh:mm:ss,DD/MM/20YY or empty
    char text[640];   // 7-bit characters, UCS2 as hexadecimal, or "DATA MESSAGE"
};
static_assert(sizeof(SmsRecord) == 704, "SmsRecord is the 704-byte file record");
static_assert(offsetof(SmsRecord, number) == 12 && offsetof(SmsRecord, status) == 32 &&
                  offsetof(SmsRecord, date) == 44 && offsetof(SmsRecord, text) == 64,
              "SmsRecord fields stand back to back");
static_assert(std::endian::native == std::endian::little,
              "SmsRecord is written as it stands, so the host must be little-endian");

inline constexpr int kSmsModePdu = 0;
inline constexpr int kSmsModeText = 1;
// Room the read's reply needs: a "+CMGR:" line and a whole PDU.
inline constexpr size_t kSmsReadReplySize = 800;
// Room for the hexadecimal PDU of a write or send and its Ctrl-Z.
inline constexpr size_t kSmsPduCommandSize = 776;

// "AT+CSCA?" into centre (UTF-16, NUL-terminated), then "AT+CSMP?" into *validity, which ends
// as the <vp> field. 1, or 0 when either command got no reply.
int SmsGetCentre(Link& link, char16_t* centre, size_t centreSize, int32_t* validity);
// "AT+CSCA=" with the number, then "AT+CSMP=" with parameter as its only field. 1 on success,
// 0 on no reply or an "ERROR" in either reply.
int SmsSetCentre(Link& link, const char16_t* centre, int parameter);
// Selects the SIM for reading, writing and receiving; 1 with the used and total counts.
int SmsSelectSimStorage(Link& link, int32_t* used, int32_t* total);
// Messages in "SM" from "AT+CPMS?", or -1.
int SmsStorageUsed(Link& link);
// 1 when the SIM memory is full (the memories are selected again), else 0.
int SmsStorageFull(Link& link);

// The record must be zero-filled with index set. 1 when it was filled, else 0 (fields filled
// before the failure stay as they are).
int SmsRead(Link& link, int mode, SmsRecord* record);
// Stores the message on the SIM as unsent; 1 with record->index set.
int SmsWrite(Link& link, int mode, SmsRecord* record);
// Sends the message; 1 when the card confirmed it ("STO SENT").
int SmsSend(Link& link, int mode, SmsRecord* record);
// "AT+CMSS=": 1 when the reply holds "+CMSS:".
int SmsSendStored(Link& link, int index);
// "AT+CMGD=": -1 on no reply, else the AtFinalResult code (0 for "OK").
int SmsDelete(Link& link, int index);
// The mode after "+CMGF:", or -1.
int SmsGetFormat(Link& link);
// -1 on no reply, else the AtFinalResult code.
int SmsSetFormat(Link& link, int mode);
int SmsSetCharset(Link& link, const char* name);

// The reply scans of SmsRead on a reply already read (length bytes, no NUL needed), so that
// they can be driven without a card. Same record rules and results as SmsRead.
int SmsParsePduReply(const char* reply, int length, SmsRecord* record);
int SmsParseTextReply(const char* reply, int length, SmsRecord* record);

// A 7-bit body as the read keeps it: ISO 8859-1, the form every other 7-bit body of the
// program has, except that '@', '$' and 'Å' (codes 0x00, 0x02, 0x0E) become ' ', '$' and ']'
// and the Greek capitals, which ISO 8859-1 lacks, stay as their codes (0x10, 0x12..0x1A), where
// ISO 8859-1 has only unused control bytes. SmsTextToWide shows such a body.
char SmsCodeToText(uint8_t code);
char16_t SmsTextToWide(char byte);

// One part of a concatenated message, from its user-data header. The record keeps it in the last
// bytes of its text field, behind the body's terminator, so the 704-byte record stays as it is.
struct SmsPartInfo {
    int reference;
    int total;
    int sequence;
};
inline constexpr int kSmsPartTrailer = 5;
inline constexpr char kSmsPartMark = 0x1F;
bool SmsPartOf(const SmsRecord& record, SmsPartInfo* part);
void SmsSetPart(SmsRecord* record, const SmsPartInfo& part);

// Everything of a PDU behind the originator address, for the read. at is the position of the
// protocol identifier in hexadecimal characters.
int ParseAfterAddress(const char* pdu, const char* pduEnd, long at, int firstOctet, int stat,
                      SmsRecord* record);

// Drops one leading '+', takes at most 32 characters, pads an odd count with 'F' and swaps
// each pair, NUL-terminated. Returns the count of real digits (the written length less the
// pad). Swapping back a field read from a PDU is the same call.
int PhoneToSemiOctets(const char* number, char* out, size_t outSize);

// One SMS-SUBMIT PDU in uppercase hexadecimal behind an empty centre field. Returns the TPDU
// length in octets (what AT+CMGS and AT+CMGW carry), 0 when out cannot hold it.
int BuildSubmitPdu(const SmsRecord& record, char* out, size_t outSize);

}  // namespace vqm
