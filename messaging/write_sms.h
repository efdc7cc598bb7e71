// What the Write SMS view decides, apart from its widgets: the counter under the text, the
// recipient field's parse (its number filter and the display form written back), the length
// question and cut, the send to each recipient in turn, and the draft. No Qt: the view shows
// the results and asks the questions; the send runs on a worker thread of the view's.
#pragma once

#include <cstddef>
#include <functional>
#include <string>
#include <vector>

#include "messaging/message_store.h"
#include "messaging/sms_at.h"
#include "messaging/write_handoff.h"

namespace vqm {

struct Link;

// How much of each field is read.
inline constexpr size_t kRecipientsReadLimit = 256;
inline constexpr size_t kTextSendReadLimit = 161;
inline constexpr size_t kTextDraftReadLimit = 256;
// One message's room, by alphabet, and what each part of a longer text holds (a concatenated
// message gives 7 septets or 3 UCS2 characters of every part to its header).
inline constexpr int kGsmLimit = 160, kUcs2Limit = 70;
inline constexpr int kGsmPartRoom = 153, kUcs2PartRoom = 67;
// The counter's result: 1 7-bit, 2 UCS2.
inline constexpr int kCodingGsm = 1, kCodingUcs2 = 2;

struct MessageCount {
    int coding = kCodingGsm;
    int count = 0;  // characters in the counted form ("\r\n" counts once)
    int limit = kGsmLimit;
    int messages = 1;  // how many messages the whole text would take
};

// The counter. The alphabet is decided on the first 161 characters, the ones a send reads; the
// count and the number of messages are of the whole text, so a text pasted or forwarded beyond
// the limit says how far over it is.
MessageCount CountMessage(const std::u16string& text);
// "%d/160" or "%d/70", and " (N SMS)" behind it when the whole text needs N > 1 messages.
std::u16string CounterText(const MessageCount& count);

// The recipient field, parsed.
struct ParsedRecipients {
    std::vector<std::string> numbers;  // filtered numbers, in field order
    int count = 0;                     // entries counted (one per number)
    std::u16string display;  // the field written back: "number;\r\n" or "name<number>;\r\n"
};
// Entries split at ';' and trimmed; empty ones skipped. "name<number...": the number is built
// from everything behind the first '<'. A bare entry that IsValidPhoneNumber refuses is skipped
// uncounted. Only the first kRecipientsReadLimit characters are read.
ParsedRecipients ParseRecipients(const std::u16string& field);
// The number filter: '+' and '(' each give a '+', digits, '*' and '#' stay, the rest goes.
std::string FilterNumber(std::u16string_view text);
// The first entry (trimmed) that the kRecipientsReadLimit characters a send reads do not hold
// whole: cut there, it would go to a shortened number, and every entry behind it would be left
// out. Empty when all of the field's entries lie within the limit.
std::u16string OverlongRecipient(const std::u16string& field);
// The refusal of a send for such an entry, naming it.
std::u16string RecipientsTooLongText(const std::u16string& entry);

// The length check before a send: ask (OK cuts, Cancel abandons) when a 7-bit text has 161
// characters or more or a UCS2 text 71 or more.
struct LengthCheck {
    bool ask = false;
    std::u16string question;
    size_t cut = 0;  // the characters kept on OK
};
LengthCheck CheckLength(const std::u16string& text, int coding);

// The texts a send or a draft ends with.
inline constexpr char16_t kLengthGsmQuestion[] =
    u"Short message length exceeded, only first 160 characters will be sent.";
inline constexpr char16_t kLengthUcs2Question[] =
    u"Short message length exceeded, only first 70 characters will be sent.";
inline constexpr char16_t kFormatFailedText[] = u"Failed to send message.";
inline constexpr char16_t kSentText[] = u"Message has been sent.";
inline constexpr char16_t kDraftSavedText[] = u"Message has been saved to Draft folder.";
inline constexpr char16_t kErrorTitle[] = u"Error";
// The stop icon of a box.
inline constexpr unsigned kMbIconStop = 0x10;
// "Cannot send message to "<number>". Please check the SMSC setting or try again later."
std::u16string CannotSendText(const std::string& number);

// How a send ended.
enum class SendEnd {
    Nothing,       // no recipient or no text: nothing was done
    FormatFailed,  // "AT+CMGF=0" failed: nothing was sent
    Sent,          // the last attempt succeeded
    Failed,        // the card refused failedNumber; later recipients were not tried
    Rejected,      // a number that cannot be sent to ended the walk, silently
};
struct SendOutcome {
    SendEnd end = SendEnd::Nothing;
    int sent = 0;
    std::string failedNumber;
};
struct SendHooks {
    // Before each attempt: its place (from 0) among the counted entries, and the number.
    std::function<void(int place, const std::string& number)> attempt;
    // Each message the card took, with its number, date and "STO SENT", to be filed as sent.
    std::function<void(const SmsRecord& record)> sent;
};
// PDU mode, then the body to each counted number in turn with SmsSend; the first failure stops
// the walk. body holds the text, coding and length; number, date and status are set here.
SendOutcome SendToRecipients(Link& link, const SmsRecord& body, const ParsedRecipients& recipients,
                             const SendHooks& hooks = {});

// The box a send ends with: its text and title, or an empty text for none.
struct SendBox {
    std::u16string text, title;
    unsigned style = 0;
};
SendBox SendEndBox(const SendOutcome& outcome);

// The body a send carries: the text read (its first kTextSendReadLimit characters), the
// counter's alphabet, the length question (ask returns true for OK) and its cut, the record
// coded. False for an empty text or a cancelled question. vqm-phone builds its body here too,
// with an ask that always refuses.
bool PrepareBody(const std::u16string& textField,
                 const std::function<bool(const std::u16string& question)>& ask, SmsRecord* body);

// Everything Send does before the card: the recipients read, the body (PrepareBody) and the
// recipients parsed. False when there is nothing to send, the question was cancelled, or the
// recipients run past what is read: then refusal holds the box to show (naming the entry the
// limit cuts), nothing is asked and nothing is sent to anyone.
struct PreparedSend {
    SmsRecord body{};
    ParsedRecipients recipients;
    std::u16string refusal;
};
bool PrepareSend(const std::u16string& recipientsField, const std::u16string& textField,
                 const std::function<bool(const std::u16string& question)>& ask,
                 PreparedSend* prepared);

// "Save To Draft": the first 256 characters go through the transfer file to the Draft page as
// "PDA DRAFT". 1 when saved; 0 for an empty text or a file that could not be written.
int SaveDraft(MessageStore& store, const std::u16string& textField);

// The fields after a request from elsewhere.
struct WriteFields {
    std::u16string recipients, text;
};
void ApplyWriteRequest(const WriteRequest& request, WriteFields* fields);

}  // namespace vqm
