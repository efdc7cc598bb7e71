#include "cardsim/card_engine.h"

#include <cctype>
#include <cstdlib>

namespace vqm::cardsim {

namespace {

constexpr size_t kMaxLine = 1024;

std::string Upper(std::string text) {
    for (char& c : text)
        c = static_cast<char>(std::toupper(static_cast<unsigned char>(c)));
    return text;
}

bool StartsWith(const std::string& text, const std::string& prefix) {
    return text.compare(0, prefix.size(), prefix) == 0;
}

// The value of "NAME=<n>" commands; false when it is not a whole number.
bool NumberAfter(const std::string& text, size_t at, int* value) {
    if (at >= text.size()) return false;
    char* end = nullptr;
    long parsed = std::strtol(text.c_str() + at, &end, 10);
    if (*end != '\0' || end == text.c_str() + at) return false;
    *value = static_cast<int>(parsed);
    return true;
}

// The ';' that ends a chained command; one inside quotes belongs to a name or a text.
size_t NextSeparator(const std::string& body, size_t from) {
    bool quoted = false;
    for (size_t i = from; i < body.size(); ++i) {
        if (body[i] == '"') quoted = !quoted;
        if (body[i] == ';' && !quoted) return i;
    }
    return std::string::npos;
}

}  // namespace

float CardEngine::FirmwareVersion() const {
    size_t at = config_.firmware.find("SW");
    return at == std::string::npos ? 0.0f : std::strtof(config_.firmware.c_str() + at + 2, nullptr);
}

void CardEngine::Feed(const char* bytes, size_t length, Clock::time_point now) {
    for (size_t i = 0; i < length; ++i) {
        if (silent_) continue;
        const char c = bytes[i];
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
        if (echo_) output_.push_back(c);
        if (c == '\r') {
            std::string line;
            line.swap(input_);
            RunLine(line, now);
        } else if (c != '\n' && input_.size() < kMaxLine) {
            input_.push_back(c);
        }
    }
}

// Text typed after a "> " prompt: Ctrl-Z hands it over, Esc cancels it.
void CardEngine::RunPromptByte(char c) {
    constexpr char kCtrlZ = 0x1A, kEscape = 0x1B;
    constexpr size_t kMaxPromptText = 4096;
    if (echo_ && c != kCtrlZ && c != kEscape) output_.push_back(c);
    if (c == kCtrlZ) {
        CommandSet* set = prompting_;
        prompting_ = nullptr;
        std::string info, errorText = "ERROR";
        const bool ok = set->Complete(promptText_, info, errorText);
        promptText_.clear();
        output_ += info;
        Result(ok ? "OK" : errorText);
    } else if (c == kEscape) {
        prompting_ = nullptr;
        promptText_.clear();
        Result("OK");
    } else if (promptText_.size() < kMaxPromptText) {
        promptText_.push_back(c);
    }
}

void CardEngine::Result(const std::string& text) {
    output_ += "\r\n" + text + "\r\n";
    // Codes that came in while a command was running follow its result, never interrupt it.
    output_ += pendingUnsolicited_;
    pendingUnsolicited_.clear();
}

void CardEngine::Unsolicited(const std::string& text) {
    if (silent_) return;
    (commandRunning_ ? pendingUnsolicited_ : output_) += "\r\n" + text + "\r\n";
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
    if (!body.empty() && std::toupper(static_cast<unsigned char>(body[0])) == 'D') {
        ok = RunCommand(body, info, errorText, deferred, now);  // the dial string holds its ';'
    } else {
        size_t start = 0;
        while (ok && !prompting_ && start <= body.size()) {
            size_t end = NextSeparator(body, start);
            std::string part =
                body.substr(start, end == std::string::npos ? std::string::npos : end - start);
            if (!part.empty() || start == 0) ok = RunCommand(part, info, errorText, deferred, now);
            if (end == std::string::npos) break;
            start = end + 1;
        }
    }
    if (deferred && ok) return;  // the network answers later
    output_ += info;
    if (prompting_ && ok) {
        output_ += "\r\n> ";
        return;
    }
    Result(ok ? "OK" : errorText);
}

bool CardEngine::RunCommand(const std::string& command, std::string& info, std::string& errorText,
                            bool& deferred, Clock::time_point now) {
    const std::string upper = Upper(command);
    auto line = [&](const std::string& text) { info += "\r\n" + text + "\r\n"; };
    if (upper.empty()) return true;
    if (upper == "E0" || upper == "E1") {
        echo_ = upper == "E1";
        return true;
    }
    if (upper == "&F" || upper == "Z") {
        echo_ = true;
        charset_ = "8859-1";
        return true;
    }
    if (upper.size() == 2 && upper[0] == 'X' && upper[1] >= '0' && upper[1] <= '5') return true;
    // The character set of names and texts on the line; the groups that carry text read it.
    if (upper == "+CSCS=?") return line("+CSCS: (\"GSM\",\"IRA\",\"8859-1\",\"UCS2\")"), true;
    if (upper == "+CSCS?") return line("+CSCS: \"" + charset_ + "\""), true;
    if (StartsWith(upper, "+CSCS=")) {
        std::string wanted = upper.substr(6);
        if (wanted.size() >= 2 && wanted.front() == '"' && wanted.back() == '"')
            wanted = wanted.substr(1, wanted.size() - 2);
        if (wanted != "GSM" && wanted != "IRA" && wanted != "8859-1" && wanted != "UCS2")
            return false;
        charset_ = wanted;
        return true;
    }
    // Clients check that the radio is on; it always is while the card is powered.
    if (upper == "+CFUN?") return line("+CFUN: 1"), true;
    if (upper == "+CFUN=1" || upper == "+CFUN=1,0") return true;
    if (upper == "+CIMI") return line("202015550123456"), true;
    for (const char* setting : {"+CLIP=", "+CRC=", "+CNMI=", "+CMEE="})
        if (StartsWith(upper, setting)) return upper.size() > std::string(setting).size();
    if (upper == "+GMI" || upper == "+CGMI") return line("Tavro Mobile Phones"), true;
    if (upper == "+GMM" || upper == "+CGMM") return line("TAVRO CARD PHONE 2.0"), true;
    if (upper == "+GMR" || upper == "+CGMR") return line(config_.firmware), true;
    if (upper == "+CGSN" || upper == "+GSN") return line("490154203237518"), true;
    if (upper == "+CSQ") return line("+CSQ: " + std::to_string(config_.signalQuality) + ",0"), true;
    if (upper == "+COPS?")
        return line("+COPS: " + std::to_string(config_.selectionMode) + ",2," +
                    std::to_string(config_.operatorCode)),
               true;
    if (upper == "+CLVL?") return line("+CLVL: " + std::to_string(volume_)), true;
    if (StartsWith(upper, "+CLVL=")) {
        int level;
        if (!NumberAfter(upper, 6, &level) || level < 0 || level > 10) return false;
        SetVolume(level);
        return true;
    }
    if (upper == "+CLCC") {
        if (state_ != CallState::None) {
            const bool international = !callNumber_.empty() && callNumber_[0] == '+';
            line("+CLCC: 1," + std::string(outgoing_ ? "0" : "1") + "," +
                 std::to_string(static_cast<int>(state_)) + ",0,0,\"" + callNumber_ + "\"," +
                 (international ? "145" : "129"));
        }
        return true;
    }
    if (StartsWith(upper, "+VTS=")) {
        if (state_ != CallState::Active || upper.size() != 6) return false;
        dtmf_.push_back(upper[5]);
        return true;
    }
    if (upper == "A") {
        if (state_ != CallState::Incoming) return false;
        state_ = CallState::Active;
        return true;
    }
    if (upper == "H" || upper == "H0") {
        EndCall();
        return true;
    }
    if (upper[0] == 'D') {
        if (state_ != CallState::None) return false;
        std::string number = command.substr(1);
        if (!number.empty() && number.back() == ';') number.pop_back();
        callNumber_ = number;
        outgoing_ = true;
        state_ = CallState::Dialing;
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
    return false;
}

void CardEngine::Tick(Clock::time_point now) {
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
            state_ = CallState::Active;
            Result("OK");
        }
    }
    if (state_ == CallState::Incoming) {
        if (now >= ringGivesUp_) {
            EndCall();
        } else if (now >= nextRing_) {
            Unsolicited("+CRING: VOICE");
            const std::string type = !callNumber_.empty() && callNumber_[0] == '+' ? "145" : "129";
            // Firmware up to 3.81 sends the number bare; later firmware quotes it.
            const bool quoted = FirmwareVersion() > 3.81f;
            Unsolicited("+CLIP: " + (quoted ? "\"" + callNumber_ + "\"" : callNumber_) + "," +
                        type);
            nextRing_ = now + std::chrono::milliseconds(config_.ringRepeatMs);
        }
    }
}

std::string CardEngine::TakeOutput() {
    std::string out;
    out.swap(output_);
    return out;
}

void CardEngine::Ring(const std::string& number, Clock::time_point now) {
    if (state_ != CallState::None) return;
    state_ = CallState::Incoming;
    outgoing_ = false;
    callNumber_ = number;
    nextRing_ = now;
    ringGivesUp_ = now + std::chrono::milliseconds(config_.ringTimeoutMs);
    Tick(now);
}

void CardEngine::CallerHangUp() {
    if (state_ == CallState::Incoming) EndCall();
}

void CardEngine::RemoteAnswer() {
    if (state_ == CallState::Dialing && commandRunning_) {
        commandRunning_ = false;
        state_ = CallState::Active;
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
    if (state_ == CallState::Incoming) state_ = CallState::Active;
}

void CardEngine::SendGarbage(size_t count) {
    for (size_t i = 0; i < count; ++i) {
        garbageState_ = garbageState_ * 1103515245u + 12345u;
        output_.push_back(static_cast<char>((garbageState_ >> 16) & 0xFF));
    }
}

void CardEngine::EndCall() {
    state_ = CallState::None;
    callNumber_.clear();
    outgoing_ = false;
}

}  // namespace vqm::cardsim
