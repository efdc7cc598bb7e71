#include "messaging/write_sms.h"

#include <algorithm>
#include <cstring>

#include "shell/messages.h"
#include "support/gsm.h"
#include "support/text.h"

namespace vqm {

namespace {

bool IsBlank(char16_t c) {
    return c == u' ' || c == u'\t' || c == u'\r' || c == u'\n';
}

std::u16string_view Trim(std::u16string_view text) {
    while (!text.empty() && IsBlank(text.front()))
        text.remove_prefix(1);
    while (!text.empty() && IsBlank(text.back()))
        text.remove_suffix(1);
    return text;
}

std::u16string Widen(const std::string& text) {
    return std::u16string(text.begin(), text.end());
}

// The counted form of text and whether it may go as 7-bit.
std::u16string Counted(const std::u16string& text) {
    std::u16string counted(text.size() + 1, u'\0');
    const int count =
        CountForLimit(text.data(), static_cast<int>(text.size()), counted.data(), counted.size());
    counted.resize(static_cast<size_t>(std::max(count, 0)));
    return counted;
}

bool GsmOnly(const std::u16string& counted) {
    return CanUseGsmAlphabetCounted(counted.data(), counted.size() * sizeof(char16_t)) != 0;
}

int MessagesFor(int count, bool gsm) {
    const int single = gsm ? kGsmLimit : kUcs2Limit;
    const int part = gsm ? kGsmPartRoom : kUcs2PartRoom;
    return count <= single ? 1 : (count + part - 1) / part;
}

}  // namespace

MessageCount CountMessage(const std::u16string& text) {
    MessageCount result;
    const std::u16string whole = Counted(text);
    const bool sentGsm = GsmOnly(Counted(text.substr(0, kTextSendReadLimit)));
    result.coding = sentGsm ? kCodingGsm : kCodingUcs2;
    result.limit = sentGsm ? kGsmLimit : kUcs2Limit;
    result.count = static_cast<int>(whole.size());
    result.messages = MessagesFor(result.count, GsmOnly(whole));
    return result;
}

std::u16string CounterText(const MessageCount& count) {
    std::string text = std::to_string(count.count) + "/" + std::to_string(count.limit);
    if (count.messages > 1) text += " (" + std::to_string(count.messages) + " SMS)";
    return Widen(text);
}

std::string FilterNumber(std::u16string_view text) {
    std::string number;
    for (char16_t c : text) {
        if (c == u'+' || c == u'(')
            number += '+';  // a '(' opens an international part: kept as the rule it has been
        else if ((c >= u'0' && c <= u'9') || c == u'*' || c == u'#')
            number += static_cast<char>(c);
    }
    return number;
}

ParsedRecipients ParseRecipients(const std::u16string& field) {
    ParsedRecipients parsed;
    const std::u16string_view read =
        std::u16string_view(field).substr(0, std::min(field.size(), kRecipientsReadLimit));
    size_t start = 0;
    while (start <= read.size()) {
        size_t end = read.find(u';', start);
        if (end == std::u16string_view::npos) end = read.size();
        const std::u16string_view token = Trim(read.substr(start, end - start));
        start = end + 1;
        if (token.empty()) continue;
        const size_t open = token.find(u'<');
        std::string number;
        if (open != std::u16string_view::npos) {
            number = FilterNumber(token.substr(open + 1));
            parsed.display +=
                std::u16string(Trim(token.substr(0, open))) + u"<" + Widen(number) + u">;\r\n";
        } else {
            const std::u16string whole(token);
            if (!IsValidPhoneNumber(whole.c_str())) continue;
            number = FilterNumber(token);
            parsed.display += Widen(number) + u";\r\n";
        }
        parsed.numbers.push_back(std::move(number));
        ++parsed.count;
    }
    return parsed;
}

std::u16string OverlongRecipient(const std::u16string& field) {
    if (field.size() <= kRecipientsReadLimit) return {};
    for (size_t start = 0; start < field.size();) {
        size_t end = field.find(u';', start);
        if (end == std::u16string::npos) end = field.size();
        const std::u16string_view raw = std::u16string_view(field).substr(start, end - start);
        const std::u16string_view token = Trim(raw);
        // Where the entry's last character stands in the field.
        const size_t tokenEnd =
            start + static_cast<size_t>(token.data() - raw.data()) + token.size();
        if (!token.empty() && tokenEnd > kRecipientsReadLimit) return std::u16string(token);
        start = end + 1;
    }
    return {};
}

std::u16string RecipientsTooLongText(const std::u16string& entry) {
    constexpr size_t kShown = 40;
    const std::u16string shown = entry.size() > kShown ? entry.substr(0, kShown) + u"..." : entry;
    return u"Too many recipients: only the first " + Widen(std::to_string(kRecipientsReadLimit)) +
           u" characters are read, and \"" + shown +
           u"\" does not fit in them. Please remove some recipients. Nothing has been sent.";
}

LengthCheck CheckLength(const std::u16string& text, int coding) {
    LengthCheck check;
    const bool gsm = coding == kCodingGsm;
    const size_t limit = gsm ? kGsmLimit : kUcs2Limit;
    check.cut = std::min(text.size(), limit);
    if (text.size() > limit) {
        check.ask = true;
        check.question = gsm ? kLengthGsmQuestion : kLengthUcs2Question;
    }
    return check;
}

std::u16string CannotSendText(const std::string& number) {
    return u"Cannot send message to \"" + Widen(number) +
           u"\". Please check the SMSC setting or try again later.";
}

SendOutcome SendToRecipients(Link& link, const SmsRecord& body, const ParsedRecipients& recipients,
                             const SendHooks& hooks) {
    SendOutcome outcome;
    if (SmsSetFormat(link, kSmsModePdu) != 0) {
        outcome.end = SendEnd::FormatFailed;
        return outcome;
    }
    const size_t walk =
        std::min(static_cast<size_t>(std::max(recipients.count, 0)), recipients.numbers.size());
    for (size_t i = 0; i < walk; ++i) {
        const std::string& number = recipients.numbers[i];
        // A number the record cannot hold whole would go to someone else: refused like one
        // IsValidPhoneNumber refuses.
        if (!IsValidPhoneNumber(Widen(number).c_str()) || number.size() >= sizeof body.number) {
            outcome.end = SendEnd::Rejected;
            return outcome;
        }
        SmsRecord record = body;
        std::memset(record.number, 0, sizeof record.number);
        std::memcpy(record.number, number.data(), number.size());
        std::memset(record.status, 0, sizeof record.status);
        StampLocalTime(&record);
        if (hooks.attempt) hooks.attempt(static_cast<int>(i), number);
        if (!SmsSend(link, kSmsModePdu, &record)) {
            outcome.end = SendEnd::Failed;
            outcome.failedNumber = number;
            return outcome;
        }
        ++outcome.sent;
        outcome.end = SendEnd::Sent;
        if (hooks.sent) hooks.sent(record);
    }
    return outcome;
}

SendBox SendEndBox(const SendOutcome& outcome) {
    switch (outcome.end) {
        case SendEnd::FormatFailed:
            return {kFormatFailedText, kErrorTitle, kMbOk | kMbIconStop | kMbTopmost};
        case SendEnd::Failed:
            return {CannotSendText(outcome.failedNumber), kErrorTitle,
                    kMbOk | kMbIconStop | kMbTopmost};
        case SendEnd::Sent:
            return {kSentText, kBoxTitle, kMbOk | kMbTopmost};
        default:
            return {};
    }
}

bool PrepareBody(const std::u16string& textField,
                 const std::function<bool(const std::u16string& question)>& ask, SmsRecord* body) {
    const MessageCount count = CountMessage(textField);
    std::u16string text = textField.substr(0, kTextSendReadLimit);
    if (text.empty()) return false;
    const LengthCheck check = CheckLength(text, count.coding);
    if (check.ask && !(ask && ask(check.question))) return false;
    text.resize(check.cut);
    *body = SmsRecord{};
    return RecordBodyFromText(text.data(), text.size(), body) >= 1;
}

bool PrepareSend(const std::u16string& recipientsField, const std::u16string& textField,
                 const std::function<bool(const std::u16string& question)>& ask,
                 PreparedSend* prepared) {
    *prepared = PreparedSend{};
    const std::u16string recipients = recipientsField.substr(0, kRecipientsReadLimit);
    if (recipients.empty() || textField.empty()) return false;
    // Only what is read is sent: an entry cut at the limit would reach a shortened number (a
    // stranger's, perhaps) and those behind it nobody, without a word.
    if (const std::u16string cut = OverlongRecipient(recipientsField); !cut.empty()) {
        prepared->refusal = RecipientsTooLongText(cut);
        return false;
    }
    if (!PrepareBody(textField, ask, &prepared->body)) return false;
    prepared->recipients = ParseRecipients(recipients);
    return true;
}

int SaveDraft(MessageStore& store, const std::u16string& textField) {
    const std::u16string text = textField.substr(0, kTextDraftReadLimit);
    if (text.empty()) return 0;
    return ClipboardCopyText(store, text.data(), text.size());
}

void ApplyWriteRequest(const WriteRequest& request, WriteFields* fields) {
    if (request.fresh) {
        fields->recipients = request.recipients;
        fields->text = request.text;
        return;
    }
    if (request.recipients.empty()) return;
    // Added entries must not run into one the user typed without its ';'.
    const std::u16string_view typed = Trim(fields->recipients);
    if (!typed.empty() && typed.back() != u';') fields->recipients += u";\r\n";
    fields->recipients += request.recipients;
}

}  // namespace vqm
