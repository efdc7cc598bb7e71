// The simulated card's AT engine: bytes in, bytes out, no I/O of its own. Time is handed in
// by the caller (Tick), so tests drive dialling delays and ring repeats without sleeping.
#pragma once

#include <chrono>
#include <cstddef>
#include <memory>
#include <set>
#include <string>
#include <vector>

#include "cardsim/command_set.h"

namespace vqm::cardsim {

using Clock = std::chrono::steady_clock;

struct EngineConfig {
    std::string firmware = "SW4.00";  // "SW3.80" and below send the caller's number unquoted
    int signalQuality = 20;           // +CSQ, 0..31 or 99
    int operatorCode = 20201;         // +COPS numeric
    int selectionMode = 0;            // +COPS: 0 automatic, 1 manual
    int dialDelayMs = 2000;           // from ATD until the far end decides
    int ringRepeatMs = 3000;          // +CRING/+CLIP repeat while ringing
    int ringTimeoutMs = 30000;        // the caller gives up
};

// Call states as AT+CLCC reports them.
enum class CallState { None = -1, Active = 0, Dialing = 2, Alerting = 3, Incoming = 4 };

class CardEngine {
  public:
    explicit CardEngine(EngineConfig config = {}) : config_(std::move(config)) {}

    // A group of further commands (message memory, phonebooks, network services); asked in
    // the order added, after the core commands.
    void AddCommandSet(std::unique_ptr<CommandSet> set) {
        set->Attach(this);
        sets_.push_back(std::move(set));
    }
    const std::vector<std::unique_ptr<CommandSet>>& CommandSets() const { return sets_; }
    // For command groups: an unsolicited code line (e.g. "+CMTI: \"SM\",3"), held back while a
    // command runs; and a change of the card's kept memory, so that it is saved.
    void Unsolicited(const std::string& text);
    void MarkChanged() { ++revision_; }

    // Bytes from the dialer. Replies and echoes queue up for TakeOutput.
    void Feed(const char* bytes, size_t length, Clock::time_point now);
    // Advances the timers: dial outcomes, ring repeats, ring time-outs.
    void Tick(Clock::time_point now);
    std::string TakeOutput();

    // The network side.
    void Ring(const std::string& number, Clock::time_point now);
    void CallerHangUp();  // an incoming call that stops ringing
    void RemoteAnswer();  // the far end answers our outgoing call
    void RemoteHangUp();  // the far end ends the call
    void LocalAnswer();   // answered on the card's own controls
    void SetBusy(const std::string& number) {
        busy_.insert(number);
        unanswered_.erase(number);
        ++revision_;
    }
    void SetUnanswered(const std::string& number) {
        unanswered_.insert(number);
        busy_.erase(number);
        ++revision_;
    }
    void SetReachable(const std::string& number) {
        busy_.erase(number);
        unanswered_.erase(number);
        ++revision_;
    }
    void SetSilent(bool silent) { silent_ = silent; }
    void SendGarbage(size_t count);

    // Settings that outlive a run change through ChangeConfig() or the setters; each change
    // of kept state, from the dialer or the network side, moves Revision() on.
    EngineConfig& ChangeConfig() {
        ++revision_;
        return config_;
    }
    const EngineConfig& Config() const { return config_; }
    unsigned long Revision() const { return revision_; }
    const std::set<std::string>& Busy() const { return busy_; }
    const std::set<std::string>& Unanswered() const { return unanswered_; }
    void SetVolume(int level) {
        volume_ = level;
        ++revision_;
    }

    bool Echo() const { return echo_; }
    // "8859-1", "GSM", "IRA" or "UCS2", as the client last chose with AT+CSCS.
    const std::string& Charset() const { return charset_; }
    int Volume() const { return volume_; }
    CallState State() const { return state_; }
    const std::string& CallNumber() const { return callNumber_; }
    const std::vector<char>& DtmfSent() const { return dtmf_; }
    float FirmwareVersion() const;

  private:
    void RunLine(const std::string& line, Clock::time_point now);
    // One basic or extended command; returns false for an error.
    bool RunCommand(const std::string& command, std::string& info, std::string& errorText,
                    bool& deferred, Clock::time_point now);
    void Result(const std::string& text);
    void RunPromptByte(char c);
    void EndCall();

    EngineConfig config_;
    std::string input_;
    std::string output_;
    std::string pendingUnsolicited_;
    bool echo_ = true;
    bool silent_ = false;
    bool commandRunning_ = false;  // a deferred ATD is waiting for the network
    bool discardLine_ = false;     // the rest of a line that aborted a dial
    int volume_ = 5;
    std::string charset_ = "8859-1";
    std::vector<std::unique_ptr<CommandSet>> sets_;
    CommandSet* prompting_ = nullptr;  // the group whose "> " prompt is collecting text
    std::string promptText_;

    CallState state_ = CallState::None;
    bool outgoing_ = false;
    std::string callNumber_;
    Clock::time_point dialDecision_{};
    Clock::time_point nextRing_{};
    Clock::time_point ringGivesUp_{};
    std::set<std::string> busy_, unanswered_;
    std::vector<char> dtmf_;
    unsigned garbageState_ = 12345;
    unsigned long revision_ = 0;
};

}  // namespace vqm::cardsim
