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
#include "cardsim/core_commands.h"

namespace vqm::cardsim {

using Clock = std::chrono::steady_clock;

// How the card speaks. Card: its own dialect (echo as ATE says, the bare numeric operator, the
// caller's number quoted by firmware version, unsolicited codes held back while a dial runs).
// Standard: a plain 27.007 modem as USB sticks and phone modules are: no echo whatever ATE says,
// "REV1" for +GMR, the operator quoted in the format +COPS=3,<f> chose (long name at first),
// "+CLIP: \"<digits>\",145,,,,0", RING or +CRING as +CRC says, "+CME ERROR: <n>" from the start
// (+CMEE=1), a vendor line ("*ECAV: ...") after every change of a call, "^RSSI: <n>" when the
// signal changes, "+CREG: 1" when the network does, and unsolicited lines sent at once, even
// in the middle of a command being typed or between the lines of a reply.
enum class Dialect { Card, Standard };

struct EngineConfig {
    Dialect dialect = Dialect::Card;
    std::string firmware = "SW4.00";  // "SW3.80" and below send the caller's number unquoted
    int signalQuality = 20;           // +CSQ, 0..31 or 99
    int operatorCode = 20201;         // +COPS numeric
    int selectionMode = 0;            // +COPS: 0 automatic, 1 manual
    int dialDelayMs = 2000;           // from ATD until the far end decides
    int ringRepeatMs = 3000;          // +CRING/+CLIP repeat while ringing
    int ringTimeoutMs = 30000;        // the caller gives up
    int vendorNoiseMs = 0;            // standard: a vendor line this often, 0 never
};

// Call states as AT+CLCC reports them.
enum class CallState { None = -1, Active = 0, Dialing = 2, Alerting = 3, Incoming = 4 };

class CardEngine {
  public:
    // The core group (identity, signal, operator, volume, call list) is always there, asked first.
    explicit CardEngine(EngineConfig config = {});

    // A group of further commands (message memory, phonebooks, network services); asked in
    // the order added, after the core group.
    void AddCommandSet(std::unique_ptr<CommandSet> set) {
        set->Attach(this);
        sets_.push_back(std::move(set));
    }
    const std::vector<std::unique_ptr<CommandSet>>& CommandSets() const { return sets_; }
    CoreCommands& Core() { return *core_; }
    const CoreCommands& Core() const { return *core_; }
    // For command groups: an unsolicited code line (e.g. "+CMTI: \"SM\",3"). The card holds it
    // back while a dial runs; a standard modem sends it at once, between the lines of a reply
    // not yet taken (after any earlier unsolicited line). And a change of the card's kept
    // memory, so that it is saved.
    void Unsolicited(const std::string& text);
    void MarkChanged() { ++revision_; }
    // The final result of a failed command for an ME error code: "ERROR" on the card and on a
    // standard modem after +CMEE=0, "+CME ERROR: <code>" after +CMEE=1 (a standard modem's
    // start), a text after +CMEE=2.
    std::string MeError(int code) const;

    // For tests that need "at any moment" to be a chosen moment: the line "\r\n<text>\r\n" goes
    // out at byte `at` of the next exchange, counting the bytes of the next command as typed
    // (0 before its first byte, so an unsolicited line in the middle of a command being typed)
    // and then the bytes of its reply. A standard modem places it there, moved on to the end of
    // the reply line it would split; the card never breaks up a reply, so there it follows the
    // reply (and a dial's result). One injection waits at a time; a new one replaces it.
    void InjectUnsolicited(const std::string& text, size_t at);

    // Bytes from the dialer. Replies and echoes queue up for TakeOutput.
    void Feed(const char* bytes, size_t length, Clock::time_point now);
    // Advances the timers: dial outcomes, ring repeats, ring time-outs.
    void Tick(Clock::time_point now);
    std::string TakeOutput();
    // The output up to the end of its first whole line of a reply (or all of it): a standard
    // modem on the line hands out one line at a time, so that unsolicited lines raised
    // meanwhile go between the lines of a reply.
    std::string TakeOutputLine();
    bool HasOutput() const { return !output_.empty(); }

    // The network side.
    void Ring(const std::string& number, Clock::time_point now);
    void CallerHangUp();  // an incoming call that stops ringing
    void RemoteAnswer();  // the far end answers our outgoing call
    void RemoteHangUp();  // the far end ends the call
    void LocalAnswer();   // answered on the card's own controls
    // A second caller during an active call, put through only where the network has call
    // waiting on (the call-waiting group decides): announced as "+CCWA: \"<number>\",<type>,1"
    // when present is true. The caller gives up after the ring time-out, or rings as a new call
    // once the active call ends. False when there is no active call or a caller waits already.
    bool RingWaiting(const std::string& number, bool present, Clock::time_point now);
    const std::string& WaitingNumber() const { return waiting_; }
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
    void SetSilent(bool silent) {
        silent_ = silent;
        held_ = false;
    }
    // The card takes the next command line that contains text and then falls silent, as a
    // card whose firmware hangs in the middle of that command: a test can pull it at a known
    // moment of an exchange. Silence ends with SetSilent(false) or a loss of power.
    void HoldAt(const std::string& text) { holdAt_ = text; }
    bool Held() const { return held_; }
    void SendGarbage(size_t count);
    // The network side's signal and registration; a standard modem reports each change with an
    // unsolicited line ("^RSSI: <n>", "+CREG: 1") that the dialer has to ignore.
    void SetSignal(int quality);
    void SetOperator(int code);
    // Power lost (pulled, powered down): every call is dropped, a half-typed command is lost and
    // a standard modem's +CRC, +CLIP and +CMEE return to their start-up values.
    void PowerLost();

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

    bool Standard() const { return config_.dialect == Dialect::Standard; }
    bool Echo() const { return echo_; }
    // "8859-1", "GSM", "IRA" or "UCS2", as the client last chose with AT+CSCS.
    const std::string& Charset() const { return charset_; }
    CallState State() const { return state_; }
    bool Outgoing() const { return outgoing_; }
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
    void SetState(CallState state);
    void SendRing();
    void SendNoise(Clock::time_point now);
    // Standard modem: where an unsolicited line may go in the output not yet taken.
    bool LineBoundary(size_t at, size_t start) const;
    void PlaceInjection(size_t replyStart);

    EngineConfig config_;
    std::string input_;
    std::string output_;
    std::string pendingUnsolicited_;
    bool echo_ = true;
    bool silent_ = false;
    std::string holdAt_;           // the command that makes the card fall silent; empty none
    bool held_ = false;            // silent since that command came
    bool commandRunning_ = false;  // a deferred ATD is waiting for the network
    bool discardLine_ = false;     // the rest of a line that aborted a dial
    bool unknownCommand_ = false;  // the last failed command was nobody's
    std::string charset_ = "8859-1";
    // +CRC, +CLIP and +CMEE as a standard modem keeps them (the card always sends +CRING and
    // +CLIP, and answers plain ERROR).
    bool cellularRing_ = false;
    bool callerId_ = false;
    int errorMode_ = 1;
    size_t unsolicitedEnd_ = 0;  // standard: the end of the last unsolicited line in output_
    bool partlyTaken_ = false;   // standard: TakeOutputLine left the rest of a reply
    struct Injection {
        std::string text;
        size_t at = 0;
        size_t seen = 0;  // bytes of the exchange typed so far
        bool armed = false;
    } injection_;
    CoreCommands* core_ = nullptr;
    std::vector<std::unique_ptr<CommandSet>> sets_;
    CommandSet* prompting_ = nullptr;  // the group whose "> " prompt is collecting text
    std::string promptText_;

    CallState state_ = CallState::None;
    bool outgoing_ = false;
    std::string callNumber_;
    Clock::time_point dialDecision_{};
    Clock::time_point nextRing_{};
    Clock::time_point ringGivesUp_{};
    std::string waiting_;    // the caller waiting behind the active call
    std::string ringsNext_;  // the waiting caller, ringing at the next tick once the call ended
    Clock::time_point waitingGivesUp_{};
    Clock::time_point nextNoise_{};
    unsigned noiseCount_ = 0;
    std::set<std::string> busy_, unanswered_;
    std::vector<char> dtmf_;
    unsigned garbageState_ = 12345;
    unsigned long revision_ = 0;
};

}  // namespace vqm::cardsim
