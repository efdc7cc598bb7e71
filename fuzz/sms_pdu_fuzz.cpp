// Feeds arbitrary replies to the message read parsers. Random bytes seldom hold a "+CMGR:"
// header, so each input is also tried as the PDU line behind a well-formed header, with its
// first byte choosing <stat>. Every buffer has exactly the bytes handed over, so a read past
// the reply is caught by the address sanitizer.
#include <cstdint>
#include <cstdio>
#include <cstring>
#include <vector>

#include "messaging/sms_at.h"
#include "messaging/sms_folder.h"

namespace {

void Check(const vqm::SmsRecord& record) {
    // Every text field must stay terminated inside its own width.
    if (!std::memchr(record.number, 0, sizeof record.number) ||
        !std::memchr(record.status, 0, sizeof record.status) ||
        !std::memchr(record.date, 0, sizeof record.date) || record.length < 0 ||
        record.length >= static_cast<int>(sizeof record.text) || record.text[record.length] != '\0')
        __builtin_trap();
}

void Parse(const std::vector<char>& reply) {
    const int length = static_cast<int>(reply.size());
    vqm::SmsRecord pdu{};
    vqm::SmsParsePduReply(reply.data(), length, &pdu);
    Check(pdu);
    // What the folder makes of the record: its part mark and the text it shows.
    vqm::SmsPartInfo part{};
    vqm::SmsPartOf(pdu, &part);
    if (vqm::MessageBodyText(pdu).size() > sizeof pdu.text) __builtin_trap();
    vqm::SmsRecord text{};
    vqm::SmsParseTextReply(reply.data(), length, &text);
    Check(text);
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
    Parse(std::vector<char>(data, data + size));
    if (size == 0) return 0;
    char header[40];
    const int headerLength =
        std::snprintf(header, sizeof header, "\r\n+CMGR: %d,,%zu\r\n", data[0] % 4, size / 2);
    std::vector<char> framed(header, header + headerLength);
    framed.insert(framed.end(), data + 1, data + size);
    Parse(framed);
    return 0;
}
