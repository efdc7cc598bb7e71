// Feeds arbitrary card replies to the field walk and the message-body decoders. The input is
// copied into a buffer of exactly its size, so any read past the reply is caught by the
// address sanitizer.
#include <cstdint>
#include <cstring>
#include <vector>

#include "support/gsm.h"
#include "support/text.h"

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
    std::vector<char> reply(data, data + size);
    const char* begin = reply.data();
    const char* end = begin + size;
    const int length = static_cast<int>(size);

    // The walk every AT wrapper does: tag, then integers and quoted fields separated by ','.
    int at = vqm::FindPattern(0, "+CLCC:", 6, begin, length);
    const char* p = at >= 0 ? begin + at + 6 : begin;
    for (int field = 0; p && p < end && field < 64; ++field) {
        int32_t value = 0;
        char text[64];
        int textLength = 0;
        const char* next = vqm::ParseInt(p, end, &value);
        if (!next) next = vqm::ParseQuoted(p, end, text, sizeof text, &textLength);
        if (!next || next >= end || *next != ',') break;
        p = next + 1;
    }

    std::vector<char> trimmed = reply;
    int trimmedLength = length;
    vqm::TrimReply(trimmed.data(), &trimmedLength);

    char codes[200];
    vqm::UnpackSeptets(begin, length, codes, sizeof codes, size > 0 ? data[0] : -1);
    char shown[200];
    vqm::GsmToDisplay(begin, length < 200 ? length : 200, shown, sizeof shown);
    uint8_t bytes[160];
    int count = vqm::HexToBytes(begin, length, bytes, sizeof bytes);
    char16_t wide[80];
    vqm::Ucs2BytesToWide(bytes, count, wide, 80);
    for (int i = 0; i + 2 <= length; i += 2)
        vqm::HexToInt(begin + i, end, 2);
    return 0;
}
