// Feeds arbitrary card replies to the device-query parsers and to a free walk of the field
// cursor. The first byte picks the parser (and a buffer size or firmware version); the rest is
// the reply, copied into a buffer of exactly its size so that any read past it is caught by the
// address sanitizer. Each output is checked to stay within its buffer and to match its length.
#include <cstdint>
#include <cstring>
#include <string>
#include <vector>

#include "link/device_at.h"
#include "support/field_cursor.h"

namespace {

// A text output: the returned length stays inside the buffer and its NUL follows it.
void CheckText(const std::vector<char>& out, int length) {
    if (length < 0 || static_cast<size_t>(length) >= out.size()) __builtin_trap();
    if (out[static_cast<size_t>(length)] != '\0') __builtin_trap();
}

// Steps chosen by the reply's own bytes, so every order of cursor calls is tried.
void WalkCursor(const char* text, int length, uint8_t selector) {
    vqm::FieldCursor cursor(text, length);
    std::vector<char> out(1 + selector % 16);
    for (int step = 0; step < 64 && !cursor.AtEnd(); ++step) {
        const char* before = cursor.Position();
        int32_t value = 0;
        int copied = -1;
        const char pick = text[(before - text + step) % length];
        switch (static_cast<unsigned char>(pick) % 10) {
            case 0:
                cursor.NextTag("+CLCC:");
                break;
            case 1:
                cursor.SeekPast(",");
                break;
            case 2:
                cursor.NextInt(&value);
                break;
            case 3:
                if (cursor.NextQuoted(out.data(), out.size(), &copied)) CheckText(out, copied);
                break;
            case 4:
                if (cursor.SeekQuoted(out.data(), out.size(), &copied)) CheckText(out, copied);
                break;
            case 5:
                if (cursor.NextNumber(out.data(), out.size(), &copied)) CheckText(out, copied);
                break;
            case 6:
                cursor.SkipField();
                break;
            case 7:
                cursor.Comma();
                break;
            case 8:
                cursor.NextLine();
                break;
            default:
                cursor.SkipSpace();
                break;
        }
        if (cursor.Position() < before || cursor.Position() > cursor.End()) __builtin_trap();
    }
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
    if (size == 0) return 0;
    const uint8_t selector = data[0];
    std::vector<char> reply(data + 1, data + size);
    const char* text = reply.data();
    const int length = static_cast<int>(reply.size());
    std::vector<char> out(1 + selector / 8 % 40);
    int n = 0;

    switch (selector % 8) {
        case 0:
            n = vqm::ParseIdentityReply(text, length, out.data(), out.size());
            CheckText(out, n);
            vqm::ParseFirmwareReply(text, length);
            break;
        case 1: {
            const int bars = vqm::ParseSignalReply(text, length);
            if (bars < 0 || bars > 4) __builtin_trap();
            break;
        }
        case 2:
            n = vqm::ParseOperatorReply(text, length, out.data(), out.size());
            CheckText(out, n);
            break;
        case 3:
            vqm::ParseVolumeReply(text, length);
            break;
        case 4: {
            int state = -1, mode = -1;
            std::string number;
            const int result = vqm::ParseCallListReply(text, length, &state, &mode, &number);
            // The number is one field of one line, at most its buffer and a '+'.
            if (number.size() > 64 || number.find_first_of("\r\n\"") != std::string::npos)
                __builtin_trap();
            if (result != vqm::kCallListCall && result != vqm::kCallListEmpty &&
                result != vqm::kCallListUnknown)
                __builtin_trap();
            // "No call" needs a final OK in the reply.
            if (result == vqm::kCallListEmpty &&
                !std::memchr(text, 'O', static_cast<size_t>(length)))
                __builtin_trap();
            break;
        }
        case 5:
        case 6: {
            const float versions[] = {0.0f, 3.80f, 3.81f, 4.00f};
            n = vqm::ParseCallerIdLine(text, length, versions[selector / 8 % 4], out.data(),
                                       out.size());
            CheckText(out, n);
            break;
        }
        default:
            if (length > 0) WalkCursor(text, length, selector);
            break;
    }
    return 0;
}
