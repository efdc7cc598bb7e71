// Feeds arbitrary card replies to the scans of the settings wrappers. The first byte picks the
// scan (and, for barring, the asked class); the rest is the reply, copied into a buffer of exactly
// its size so that any read past it is caught by the address sanitizer.
#include <cstdint>
#include <cstring>
#include <vector>

#include "settings/barring_at.h"
#include "settings/call_waiting_at.h"
#include "settings/forwarding_at.h"
#include "settings/network_at.h"
#include "settings/security_at.h"

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
    if (size == 0) return 0;
    const uint8_t selector = data[0];
    std::vector<char> reply(data + 1, data + size);
    const char* text = reply.data();
    const int length = static_cast<int>(reply.size());

    switch (selector % 6) {
        case 0: {
            // A short list, so that a full list stops the scan as well as the reply's end.
            const int maxNames = 1 + selector / 6 % 8;
            std::vector<vqm::OperatorName> names(static_cast<size_t>(maxNames));
            int count = 0;
            vqm::ParseOperatorSearch(text, length, names.data(), maxNames, &count);
            if (count < 0 || count > maxNames) __builtin_trap();
            break;
        }
        case 1:
            vqm::ParseNetworkMode(text, length);
            break;
        case 2: {
            std::vector<char16_t> number(1 + selector / 6 % 40);
            vqm::ParseForwardReply(text, length, number.data(), number.size());
            break;
        }
        case 3:
        case 4: {
            // Without the tag the card's own error report is read, worded from the reply.
            vqm::CardError error;
            if (selector % 6 == 3)
                vqm::ParseBarringReply(text, length, 1 << (selector / 6 % 3), &error);
            else
                vqm::ParseLockReply(text, length, &error);
            if (std::strlen(vqm::CardErrorReason(error)) >= sizeof error.text) __builtin_trap();
            break;
        }
        default: {
            const int waiting = vqm::ParseCallWaitingReply(text, length);
            if (waiting < -1 || waiting > 1) __builtin_trap();
            std::vector<char> number(1 + selector / 6 % 40);
            const int n = vqm::ParseCallWaitingLine(text, length, number.data(), number.size());
            if (n < 0 || static_cast<size_t>(n) >= number.size() || number[n] != '\0')
                __builtin_trap();
            break;
        }
    }
    return 0;
}
