#include "cardsim/card_engine.h"

#include <algorithm>
#include <cctype>
#include <cstdlib>

#include "cardsim/arguments.h"

namespace vqm::cardsim {

namespace {

constexpr size_t kMaxLine = 1024;

// +CME ERROR codes of 27.007 the engine answers with on a standard modem.
constexpr int kNotAllowed = 3;
constexpr int kUnknownError = 100;

std::string Upper(std::string text) {
    for (char& c : text)
        c = static_cast<char>(std::toupper(static_cast<unsigned char>(c)));
    return text;
}

bool StartsWith(const std::string& text, const std::string& prefix) {
    return text.compare(0, prefix.size(), prefix) == 0;
}

// The value of "NAME=<n>" for a setting of 0 or 1 (2 for +CMEE); false for anything else.
bool Setting(const std::string& args, int high, int* value) {
    std::vector<Argument> fields;
    if (!SplitArguments(args, &fields) || fields.size() != 1 || fields[0].quoted ||
        fields[0].text.size() != 1 || fields[0].text[0] < '0' || fields[0].text[0] > '0' + high)
        return false;
    *value = fields[0].text[0] - '0';
    return true;
}

// The call's state as an Ericsson-style "*ECAV:" reports it: 0 idle, 1 calling, 3 active,
// 6 alerting (a call coming in).
int VendorCallState(CallState state) {
    switch (state) {
        case CallState::None:
            return 0;
        case CallState::Dialing:
            return 1;
        case CallState::Active:
            return 3;
        case CallState::Alerting:
        case CallState::Incoming:
            return 6;
    }
    return 0;
}

}  // namespace

CardEngine::CardEngine(EngineConfig config) : config_(std::move(config)) {
    auto core = std::make_unique<CoreCommands>();
    core_ = core.get();
    AddCommandSet(std::move(core));
}

float CardEngine::FirmwareVersion() const {
    size_t at = config_.firmware.find("SW");
    return at == std::string::npos ? 0.0f : std::strtof(config_.firmware.c_str() + at + 2, nullptr);
}

std::string CardEngine::MeError(int code) const {
    if (!Standard() || errorMode_ == 0) return "ERROR";
    if (errorMode_ == 2) {
        switch (code) {
            case 3:
                return "+CME ERROR: operation not allowed";
            case 4:
                return "+CME ERROR: operation not supported";
            case 50:
                return "+CME ERROR: Incorrect parameters";
            case 100:
                return "+CME ERROR: unknown";
        }
    }
    return "+CME ERROR: " + std::to_string(code);
}

void CardEngine::InjectUnsolicited(const std::string& text, size_t at) {
    injection_ = Injection{text, at, 0, true};
}

void CardEngine::Feed(const char* bytes, size_t length, Clock::time_point now) {
    for (size_t i = 0; i < length; ++i) {
        if (silent_) continue;
        const char c = bytes[i];
        if (injection_.armed && injection_.seen >= injection_.at) {
            injection_.armed = false;
            Unsolicited(injection_.text);
        }
        if (injection_.armed) ++injection_.seen;
        if (commandRunning_) {
            // As on a modem, any character while a dial is pending aborts it; the rest of
            // that line is not a command.
            commandRunning_ = false;
            discardLine_ = true;
            EndCall();
            Result("NO CARRIER");
        }
        if (prompting_) {
            RunPromptByte(c);
            continue;
        }
        if (discardLine_) {
            if (c == '\r') discardLine_ = false;
            continue;
        }
        if (echo_ && !Standard()) output_.push_back(c);
        if (c == '\r' && !holdAt_.empty() && input_.find(holdAt_) != std::string::npos) {
            input_.clear();
            holdAt_.clear();
            held_ = silent_ = true;
            continue;
        }
        if (c == '\r') {
            std::string line;
            line.swap(input_);
            const size_t replyStart = output_.size();
            RunLine(line, now);
            if (injection_.armed) PlaceInjection(replyStart);
        } else if (c != '\n' && input_.size() < kMaxLine) {
            input_.push_back(c);
        }
    }
}

// Text typed after a "> " prompt: Ctrl-Z hands it over, Esc cancels it.
void CardEngine::RunPromptByte(char c) {
    constexpr char kCtrlZ = 0x1A, kEscape = 0x1B;
    constexpr size_t kMaxPromptText = 4096;
    if (echo_ && !Standard() && c != kCtrlZ && c != kEscape) output_.push_back(c);
    const size_t replyStart = output_.size();
    if (c == kCtrlZ) {
        CommandSet* set = prompting_;
        prompting_ = nullptr;
        std::string info, errorText = "ERROR";
        const bool ok = set->Complete(promptText_, info, errorText);
        promptText_.clear();
        output_ += info;
        if (!ok && Standard() && errorText == "ERROR") errorText = MeError(kUnknownError);
        Result(ok ? "OK" : errorText);
    } else if (c == kEscape) {
        prompting_ = nullptr;
        promptText_.clear();
        Result("OK");
    } else {
        if (promptText_.size() < kMaxPromptText) promptText_.push_back(c);
        return;  // no reply yet
    }
    if (injection_.armed) PlaceInjection(replyStart);
}

void CardEngine::Result(const std::string& text) {
    output_ += "\r\n" + text + "\r\n";
    // Codes that came in while a command was running follow its result, never interrupt it.
    output_ += pendingUnsolicited_;
    pendingUnsolicited_.clear();
}

// A standard modem's unsolicited line may go where a reply line has ended and the next begins
// ("...\r\n" followed by "\r\n..."), or at either end of what is not yet taken.
bool CardEngine::LineBoundary(size_t at, size_t start) const {
    if (at == start || at >= output_.size()) return true;
    return at >= 2 && output_[at - 1] == '\n' && output_[at - 2] == '\r' &&
           output_.compare(at, 2, "\r\n") == 0;
}

void CardEngine::Unsolicited(const std::string& text) {
    if (silent_) return;
    const std::string line = "\r\n" + text + "\r\n";
    if (!Standard()) {
        (commandRunning_ ? pendingUnsolicited_ : output_) += line;
        return;
    }
    // Sent at once: if a reply is still waiting to go out, between its lines, after any
    // unsolicited line already placed there, so that they keep their order.
    // Where a reply was already partly handed out, its rest begins at a line boundary.
    size_t at = std::max<size_t>(unsolicitedEnd_, partlyTaken_ ? 0 : 1);
    while (at < output_.size() && !LineBoundary(at, 0))
        ++at;
    at = std::min(at, output_.size());
    output_.insert(at, line);
    unsolicitedEnd_ = at + line.size();
}

void CardEngine::PlaceInjection(size_t replyStart) {
    injection_.armed = false;
    const size_t offset = injection_.at - std::min(injection_.at, injection_.seen);
    size_t at = replyStart + offset;
    if (!Standard()) {
        Unsolicited(injection_.text);  // after the reply, and after a pending dial's result
        return;
    }
    at = std::min(at, output_.size());
    while (!LineBoundary(at, replyStart))
        ++at;
    const std::string line = "\r\n" + injection_.text + "\r\n";
    output_.insert(at, line);
    unsolicitedEnd_ = std::max(unsolicitedEnd_, at + line.size());
}

void CardEngine::RunLine(const std::string& rawLine, Clock::time_point now) {
    std::string line = rawLine;
    while (!line.empty() && std::isspace(static_cast<unsigned char>(line.back())))
        line.pop_back();
    if (line.empty()) return;
    if (Upper(line.substr(0, 2)) != "AT") {
        Result("ERROR");
        return;
    }
    const std::string body = line.substr(2);
    std::string info, errorText = "ERROR";
    bool deferred = false;
    bool ok = true;
    unknownCommand_ = false;
    if (!body.empty() && std::toupper(static_cast<unsigned char>(body[0])) == 'D') {
        ok = RunCommand(body, info, errorText, deferred, now);  // the dial string holds its ';'
    } else {
        size_t start = 0;
        while (ok && !prompting_ && start <= body.size()) {
            const size_t end = CommandEnd(body, start);
            std::string part = body.substr(start, end - start);
            if (!part.empty() || start == 0) ok = RunCommand(part, info, errorText, deferred, now);
            if (end == body.size()) break;
            start = end + 1;
        }
    }
    if (deferred && ok) return;  // the network answers later
    output_ += info;
    if (prompting_ && ok) {
        output_ += "\r\n> ";
        return;
    }
    // A standard modem reports a known command's failure as an ME error; one it does not know
    // stays a plain ERROR, as on any modem.
    if (!ok && Standard() && errorText == "ERROR" && !unknownCommand_)
        errorText = MeError(kUnknownError);
    Result(ok ? "OK" : errorText);
}

bool CardEngine::RunCommand(const std::string& command, std::string& info, std::string& errorText,
                            bool& deferred, Clock::time_point now) {
    const std::string upper = Upper(command);
    auto line = [&](const std::string& text) { info += "\r\n" + text + "\r\n"; };
    if (upper.empty()) return true;
    // One reading of parameters for every group: a command whose parameters do not split
    // (an unclosed quote, text beside a quoted field) is refused before any group sees it.
    const size_t equals = upper.find('=');
    if (upper[0] != 'D' && equals != std::string::npos) {
        std::vector<Argument> fields;
        if (!SplitArguments(command.substr(equals + 1), &fields)) return false;
    }
    if (upper == "E0" || upper == "E1") {
        echo_ = upper == "E1";  // a standard modem takes the setting but never echoes
        return true;
    }
    if (upper == "&F" || upper == "Z") {
        echo_ = true;
        charset_ = "8859-1";
        cellularRing_ = callerId_ = false;
        return true;
    }
    if (upper.size() == 2 && upper[0] == 'X' && upper[1] >= '0' && upper[1] <= '5') return true;
    // The character set of names and texts on the line; the groups that carry text read it.
    if (upper == "+CSCS=?") return line("+CSCS: (\"GSM\",\"IRA\",\"8859-1\",\"UCS2\")"), true;
    if (upper == "+CSCS?") return line("+CSCS: \"" + charset_ + "\""), true;
    if (StartsWith(upper, "+CSCS=")) {
        std::vector<Argument> fields;
        SplitArguments(upper.substr(6), &fields);
        const std::string wanted = fields.size() == 1 ? fields[0].text : std::string();
        if (wanted != "GSM" && wanted != "IRA" && wanted != "8859-1" && wanted != "UCS2")
            return false;
        charset_ = wanted;
        return true;
    }
    if (Standard()) {
        // How a standard modem reports rings, callers and errors.
        int value = 0;
        if (upper == "+CRC?") return line("+CRC: " + std::to_string(cellularRing_ ? 1 : 0)), true;
        if (upper == "+CLIP?")
            return line("+CLIP: " + std::to_string(callerId_ ? 1 : 0) + ",1"), true;
        if (upper == "+CMEE?") return line("+CMEE: " + std::to_string(errorMode_)), true;
        if (StartsWith(upper, "+CRC=")) {
            if (!Setting(upper.substr(5), 1, &value)) return false;
            cellularRing_ = value == 1;
            return true;
        }
        if (StartsWith(upper, "+CLIP=")) {
            if (!Setting(upper.substr(6), 1, &value)) return false;
            callerId_ = value == 1;
            return true;
        }
        if (StartsWith(upper, "+CMEE=")) {
            if (!Setting(upper.substr(6), 2, &value)) return false;
            errorMode_ = value;
            return true;
        }
    }
    for (const char* setting : {"+CLIP=", "+CRC=", "+CNMI=", "+CMEE="})
        if (StartsWith(upper, setting)) return upper.size() > std::string(setting).size();
    if (StartsWith(upper, "+VTS=")) {
        if (state_ != CallState::Active || upper.size() != 6) {
            errorText = MeError(kNotAllowed);
            return false;
        }
        dtmf_.push_back(upper[5]);
        return true;
    }
    if (upper == "A") {
        if (state_ != CallState::Incoming) {
            errorText = MeError(kNotAllowed);
            return false;
        }
        SetState(CallState::Active);
        return true;
    }
    if (upper == "H" || upper == "H0") {
        EndCall();
        return true;
    }
    if (upper[0] == 'D') {
        if (state_ != CallState::None) {
            errorText = MeError(kNotAllowed);
            return false;
        }
        std::string number = command.substr(1);
        if (!number.empty() && number.back() == ';') number.pop_back();
        callNumber_ = number;
        outgoing_ = true;
        SetState(CallState::Dialing);
        dialDecision_ = now + std::chrono::milliseconds(config_.dialDelayMs);
        commandRunning_ = true;
        deferred = true;
        return true;
    }
    for (const auto& set : sets_) {
        switch (set->Run(upper, command, info, errorText)) {
            case Handled::No:
                continue;
            case Handled::Ok:
                return true;
            case Handled::Error:
                return false;
            case Handled::Prompt:
                prompting_ = set.get();
                return true;
        }
    }
    unknownCommand_ = true;
    return false;
}

void CardEngine::Tick(Clock::time_point now) {
    if (Standard() && config_.vendorNoiseMs > 0) SendNoise(now);
    if (state_ == CallState::Dialing && commandRunning_ && now >= dialDecision_) {
        commandRunning_ = false;
        const bool dialable = !callNumber_.empty() &&
                              callNumber_.find_first_not_of("+0123456789*#") == std::string::npos;
        if (!dialable) {
            EndCall();
            Result("NO CARRIER");
        } else if (busy_.count(callNumber_)) {
            EndCall();
            Result("BUSY");
        } else if (unanswered_.count(callNumber_)) {
            EndCall();
            Result("NO ANSWER");
        } else {
            SetState(CallState::Active);
            Result("OK");
        }
    }
    if (!waiting_.empty() && now >= waitingGivesUp_) waiting_.clear();
    if (!ringsNext_.empty() && state_ == CallState::None) {
        std::string number;
        number.swap(ringsNext_);
        Ring(number, now);
    }
    if (state_ == CallState::Incoming) {
        if (now >= ringGivesUp_) {
            EndCall();
        } else if (now >= nextRing_) {
            SendRing();
            nextRing_ = now + std::chrono::milliseconds(config_.ringRepeatMs);
        }
    }
}

// A standard modem's vendor lines that mean nothing to the dialer, now and then.
void CardEngine::SendNoise(Clock::time_point now) {
    if (nextNoise_ == Clock::time_point{})
        nextNoise_ = now + std::chrono::milliseconds(config_.vendorNoiseMs);
    if (now < nextNoise_) return;
    nextNoise_ = now + std::chrono::milliseconds(config_.vendorNoiseMs);
    switch (noiseCount_++ % 3) {
        case 0:
            Unsolicited("^RSSI: " + std::to_string(config_.signalQuality));
            break;
        case 1:
            Unsolicited("+CREG: 1");
            break;
        default:
            Unsolicited("^MODE: 3,2");
            break;
    }
}

void CardEngine::SendRing() {
    const bool international = !callNumber_.empty() && callNumber_[0] == '+';
    const std::string type = international ? "145" : "129";
    if (Standard()) {
        // 27.007: RING unless +CRC=1, the caller only after +CLIP=1, the number without its
        // '+' (the type says it is international) and the CLI validity last.
        Unsolicited(cellularRing_ ? "+CRING: VOICE" : "RING");
        if (callerId_)
            Unsolicited("+CLIP: \"" + callNumber_.substr(international ? 1 : 0) + "\"," + type +
                        ",,,,0");
        return;
    }
    Unsolicited("+CRING: VOICE");
    // Firmware up to 3.81 sends the number bare; later firmware quotes it.
    const bool quoted = FirmwareVersion() > 3.81f;
    Unsolicited("+CLIP: " + (quoted ? "\"" + callNumber_ + "\"" : callNumber_) + "," + type);
}

std::string CardEngine::TakeOutput() {
    std::string out;
    out.swap(output_);
    unsolicitedEnd_ = 0;
    partlyTaken_ = false;
    return out;
}

std::string CardEngine::TakeOutputLine() {
    size_t at = 1;
    while (at < output_.size() && !LineBoundary(at, 0))
        ++at;
    at = std::min(at, output_.size());
    std::string out = output_.substr(0, at);
    output_.erase(0, at);
    unsolicitedEnd_ -= std::min(unsolicitedEnd_, at);
    partlyTaken_ = !output_.empty();
    return out;
}

void CardEngine::Ring(const std::string& number, Clock::time_point now) {
    if (state_ != CallState::None) return;
    outgoing_ = false;
    callNumber_ = number;
    SetState(CallState::Incoming);
    nextRing_ = now;
    ringGivesUp_ = now + std::chrono::milliseconds(config_.ringTimeoutMs);
    Tick(now);
}

bool CardEngine::RingWaiting(const std::string& number, bool present, Clock::time_point now) {
    if (state_ != CallState::Active || !waiting_.empty() || number.empty()) return false;
    waiting_ = number;
    waitingGivesUp_ = now + std::chrono::milliseconds(config_.ringTimeoutMs);
    if (!present) return true;
    // As the caller id: a standard modem drops the '+' and lets the type say it.
    const bool international = number[0] == '+';
    const std::string shown = Standard() && international ? number.substr(1) : number;
    Unsolicited("+CCWA: \"" + shown + "\"," + (international ? "145" : "129") + ",1");
    return true;
}

void CardEngine::CallerHangUp() {
    if (state_ == CallState::Incoming) EndCall();
    waiting_.clear();
    ringsNext_.clear();
}

void CardEngine::RemoteAnswer() {
    if (state_ == CallState::Dialing && commandRunning_) {
        commandRunning_ = false;
        SetState(CallState::Active);
        Result("OK");
    }
}

void CardEngine::RemoteHangUp() {
    if (state_ == CallState::Active) {
        EndCall();
        Unsolicited("NO CARRIER");
    } else if (state_ == CallState::Dialing && commandRunning_) {
        commandRunning_ = false;
        EndCall();
        Result("NO CARRIER");
    }
}

void CardEngine::LocalAnswer() {
    if (state_ == CallState::Incoming) SetState(CallState::Active);
}

void CardEngine::SendGarbage(size_t count) {
    for (size_t i = 0; i < count; ++i) {
        garbageState_ = garbageState_ * 1103515245u + 12345u;
        output_.push_back(static_cast<char>((garbageState_ >> 16) & 0xFF));
    }
}

void CardEngine::SetSignal(int quality) {
    const bool changed = quality != config_.signalQuality;
    ChangeConfig().signalQuality = quality;
    // ^RSSI counts 0..31 as +CSQ does, 99 unknown.
    if (changed && Standard()) Unsolicited("^RSSI: " + std::to_string(quality));
}

void CardEngine::SetOperator(int code) {
    const bool changed = code != config_.operatorCode;
    ChangeConfig().operatorCode = code;
    if (changed && Standard()) Unsolicited("+CREG: 1");
}

void CardEngine::PowerLost() {
    EndCall();
    ringsNext_.clear();
    commandRunning_ = discardLine_ = false;
    prompting_ = nullptr;
    promptText_.clear();
    input_.clear();
    output_.clear();
    pendingUnsolicited_.clear();
    unsolicitedEnd_ = 0;
    partlyTaken_ = false;
    injection_.armed = false;
    // A card that hung comes back from a power cut answering, and waits for no command.
    holdAt_.clear();
    if (held_) silent_ = held_ = false;
    // A modem that comes back from a power cut has its start-up settings again.
    if (Standard()) {
        cellularRing_ = callerId_ = false;
        errorMode_ = 1;
    }
}

void CardEngine::SetState(CallState state) {
    if (state == state_) return;
    state_ = state;
    // A standard modem's vendor report of every change of a call, which the dialer must ignore.
    if (Standard()) Unsolicited("*ECAV: 1," + std::to_string(VendorCallState(state)) + ",1");
}

void CardEngine::EndCall() {
    // The network puts a waiting caller through as a new call once the line is free.
    if (!waiting_.empty()) ringsNext_.swap(waiting_);
    waiting_.clear();
    SetState(CallState::None);
    callNumber_.clear();
    outgoing_ = false;
}

}  // namespace vqm::cardsim
