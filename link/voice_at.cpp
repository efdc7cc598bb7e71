#include "link/voice_at.h"

#include <cstdio>

#include "link/link.h"

namespace vqm {

namespace {

constexpr float kLastUncancellableFirmware = 3.81f;
// A network takes a while to connect a call, but not this long: past it the dial is given up
// rather than left on screen for ever when the card's answer went missing.
constexpr int kDialAnswerLimitMs = 120000;
// Answering is a network operation too, but a short one.
constexpr int kAnswerLimitMs = 20000;

}  // namespace

int DialExchange(Link& link, const char* number, std::atomic<int>& cancel) {
    // The flag is read and cleared in one step, so a cancel is never taken twice.
    auto takeCancel = [&cancel] { return cancel.exchange(0) == 1; };
    if (link.portState.load() == 0 || takeCancel()) return -1;

    char command[48];
    int commandLength = std::snprintf(command, sizeof command, "ATD%s;\r", number ? number : "");
    if (commandLength < 0) commandLength = 0;
    if (commandLength >= static_cast<int>(sizeof command))
        commandLength = static_cast<int>(sizeof command) - 1;

    ExchangeOptions options;
    options.answerLimitMs = kDialAnswerLimitMs;
    // Older card firmware cannot take the dial back once sent: the wait runs to the card's
    // answer (or until the port closes). A modem that is not the card (no firmware version
    // of the card's form) can.
    const float firmware = link.firmwareVersion;
    if (firmware > kLastUncancellableFirmware || firmware == 0.0f) {
        options.cancel = &cancel;
        options.abortOnCancel = true;
    }
    char reply[256] = {};
    const int length = static_cast<int>(AtExchange(link, command, reply, sizeof reply, options));
    if (length == 0 || takeCancel()) return -1;
    // Only as many reply bytes as the command had are searched for the result.
    return AtFinalResult(reply, length < commandLength ? length : commandLength);
}

int AnswerCall(Link& link) {
    char reply[256];
    const int length =
        static_cast<int>(AtCommandWithin(link, "ATA\r", reply, sizeof reply, kAnswerLimitMs));
    return length == 0 ? -1 : AtFinalResult(reply, length);
}

int HangUp(Link& link) {
    char reply[256];
    return AtCommandWithin(link, "ATH\r", reply, sizeof reply, kQueryAnswerLimitMs) > 0 ? 1 : 0;
}

int SendDtmf(Link& link, char c) {
    int state = -1, mode = -1;
    if (QueryCallState(link, &state, &mode) != 1 || state != 0 || mode != 0) return 0;
    char command[16], reply[256];
    std::snprintf(command, sizeof command, "AT+VTS=%c\r", c);
    return AtCommandWithin(link, command, reply, sizeof reply, kQueryAnswerLimitMs) > 0 ? 1 : 0;
}

}  // namespace vqm
