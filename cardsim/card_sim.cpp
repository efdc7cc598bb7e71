#include "cardsim/card_sim.h"

#include <fcntl.h>
#include <poll.h>
#include <stdlib.h>
#include <unistd.h>

#include <filesystem>
#include <fstream>
#include <sstream>

#include "support/files.h"

namespace vqm::cardsim {

namespace fs = std::filesystem;

namespace {

// The rest of a line after its first word, as typed (message texts keep their blanks).
std::string AfterFirstWord(const std::string& line) {
    const size_t wordAt = line.find_first_not_of(" \t");
    if (wordAt == std::string::npos) return {};
    const size_t restAt = line.find_first_not_of(" \t", line.find_first_of(" \t", wordAt));
    return restAt == std::string::npos ? std::string() : line.substr(restAt);
}

}  // namespace

CardSim::CardSim(SimConfig config) : config_(std::move(config)), engine_(config_.engine) {
    for (auto& set : StandardCommandSets())
        engine_.AddCommandSet(std::move(set));
    LoadState();
}

std::string CardSim::ControlHelp() {
    std::string help = kControlHelp;
    for (const auto& set : StandardCommandSets())
        help += set->ControlHelp();
    return help;
}

CardSim::~CardSim() {
    PowerDown();
}

bool CardSim::Powered() const {
    std::lock_guard<std::mutex> lock(mutex_);
    return master_ >= 0;
}

std::string CardSim::DevicePath() const {
    std::lock_guard<std::mutex> lock(mutex_);
    return slavePath_;
}

bool CardSim::PowerUp() {
    std::lock_guard<std::mutex> power(powerMutex_);
    if (Powered()) return true;
    if (!inserted_) return false;
    int master = posix_openpt(O_RDWR | O_NOCTTY | O_CLOEXEC);
    if (master < 0 || grantpt(master) != 0 || unlockpt(master) != 0) {
        if (master >= 0) close(master);
        return false;
    }
    {
        std::lock_guard<std::mutex> lock(mutex_);
        master_ = master;
        slavePath_ = ptsname(master);
    }
    stop_ = false;
    worker_ = std::thread([this] { Run(); });
    Register();
    return true;
}

void CardSim::PowerDown() {
    std::lock_guard<std::mutex> power(powerMutex_);
    Unregister();
    stop_ = true;
    if (worker_.joinable()) worker_.join();
    std::lock_guard<std::mutex> lock(mutex_);
    // A card without power has no call: it does not come back when the card does.
    engine_.PowerLost();
    if (master_ >= 0) close(master_);
    master_ = -1;
    slavePath_.clear();
}

void CardSim::Register() {
    if (config_.runtimeDir.empty()) return;
    const fs::path entry = fs::path(config_.runtimeDir) / "Drivers" / "Active" / config_.driverKey;
    std::error_code error;
    fs::create_directories(entry, error);
    std::ofstream(entry / "PnpId") << kCardPnpId << "\n";
    std::ofstream(entry / "Name") << DevicePath() << "\n";
}

void CardSim::Unregister() {
    if (config_.runtimeDir.empty()) return;
    std::error_code error;
    fs::remove_all(fs::path(config_.runtimeDir) / "Drivers" / "Active" / config_.driverKey, error);
}

void CardSim::Run() {
    // Bytes leave no faster than the line carries them: each takes 10 bit times.
    const auto byteTime = config_.baud > 0
                              ? std::chrono::nanoseconds(10'000'000'000LL / config_.baud)
                              : std::chrono::nanoseconds(0);
    auto lineFree = Clock::now();
    std::string pending;
    bool more = false;  // the engine holds output not yet taken
    while (!stop_) {
        int fd;
        {
            std::lock_guard<std::mutex> lock(mutex_);
            fd = master_;
        }
        if (fd < 0) return;
        pollfd p{fd, POLLIN, 0};
        // Wake often enough for the engine's timers and to keep sending at the line rate.
        int ready = poll(&p, 1, pending.empty() && !more ? 5 : 0);
        char buffer[256];
        ssize_t n = ready > 0 && (p.revents & POLLIN) ? read(fd, buffer, sizeof buffer) : 0;
        {
            std::lock_guard<std::mutex> lock(mutex_);
            const auto now = Clock::now();
            if (n > 0) engine_.Feed(buffer, static_cast<size_t>(n), now);
            engine_.Tick(now);
            // A standard modem lets unsolicited lines in between the lines of a reply, so it
            // hands its output over one line at a time, as the line takes it.
            if (!engine_.Standard())
                pending += engine_.TakeOutput();
            else if (pending.empty())
                pending = engine_.TakeOutputLine();
            more = engine_.HasOutput();
            if (engine_.Revision() != savedRevision_) SaveState();
        }
        while (!pending.empty() && !stop_) {
            const auto now = Clock::now();
            if (lineFree < now) lineFree = now;
            if (byteTime.count() > 0 && lineFree > now + std::chrono::milliseconds(1)) {
                std::this_thread::sleep_until(lineFree - std::chrono::microseconds(500));
            }
            if (write(fd, pending.data(), 1) != 1) break;
            pending.erase(0, 1);
            lineFree += byteTime;
            // Keep reading while sending: an echo must not wait behind a long reply.
            if (byteTime.count() > 0) break;
        }
    }
}

std::string CardSim::Control(const std::string& line) {
    std::istringstream words(line);
    std::string command, argument;
    words >> command >> argument;
    if (command.empty()) return "ERROR: which command?";
    if (command == "pull") {
        inserted_ = false;
        PowerDown();
    } else if (command == "insert") {
        inserted_ = true;  // back in its slot, powered down until the card manager powers it
    } else if (command == "power-down") {
        PowerDown();
    } else if (command == "power-up") {
        if (!inserted_) return "ERROR: no card inserted";
        if (!PowerUp()) return "ERROR: no pseudo-terminal";
    } else {
        std::lock_guard<std::mutex> lock(mutex_);
        if (command == "status") return "OK " + Status();
        std::string result;
        const std::string rest = AfterFirstWord(line);
        if (command == "unsolicited" || command == "inject") return ControlLine(command, rest);
        if (command == "hold") {
            if (rest.empty()) return "ERROR: hold needs a command's text, e.g. +CMGS=";
            engine_.HoldAt(rest);
            return "OK";
        }
        for (const auto& set : engine_.CommandSets()) {
            result = set->Control(command, rest);
            if (!result.empty()) break;
        }
        if (result.empty()) result = ControlEngine(command, argument);
        if (result != "OK") return result;
    }
    std::lock_guard<std::mutex> lock(mutex_);
    SaveState();
    return "OK";
}

std::string CardSim::ControlEngine(const std::string& command, const std::string& argument) {
    const auto now = Clock::now();
    auto needs = [&](const char* what) { return "ERROR: " + command + " needs " + what; };
    if (command == "ring") {
        if (argument.empty()) return needs("a number");
        if (engine_.State() != CallState::None) return "ERROR: a call is in progress";
        engine_.Ring(argument, now);
    } else if (command == "caller-hangup") {
        engine_.CallerHangUp();
    } else if (command == "remote-answer") {
        engine_.RemoteAnswer();
    } else if (command == "remote-hangup") {
        engine_.RemoteHangUp();
    } else if (command == "local-answer") {
        engine_.LocalAnswer();
    } else if (command == "busy" || command == "unanswered" || command == "reachable") {
        if (argument.empty()) return needs("a number");
        if (command == "busy") engine_.SetBusy(argument);
        if (command == "unanswered") engine_.SetUnanswered(argument);
        if (command == "reachable") engine_.SetReachable(argument);
    } else if (command == "signal" || command == "operator") {
        // Through the engine, so that a standard modem reports the change.
        char* end = nullptr;
        long value = std::strtol(argument.c_str(), &end, 10);
        if (argument.empty() || *end != '\0') return needs("a number");
        if (command == "signal" && !((value >= 0 && value <= 31) || value == 99))
            return needs("a quality from 0 to 31, or 99");
        if (command == "operator" && (value < 100 || value > 999999))
            return needs("a network code such as 20201");
        if (command == "signal")
            engine_.SetSignal(static_cast<int>(value));
        else
            engine_.SetOperator(static_cast<int>(value));
    } else if (command == "firmware") {
        if (argument.empty()) return needs("a version such as SW3.80");
        engine_.ChangeConfig().firmware = argument.rfind("SW", 0) == 0 ? argument : "SW" + argument;
    } else if (command == "silent") {
        if (argument != "on" && argument != "off") return needs("on or off");
        engine_.SetSilent(argument == "on");
    } else if (command == "garbage") {
        long count = std::strtol(argument.c_str(), nullptr, 10);
        if (count <= 0 || count > 65536) return needs("a byte count up to 65536");
        engine_.SendGarbage(static_cast<size_t>(count));
    } else {
        return "ERROR: unknown command '" + command + "'";
    }
    return "OK";
}

// "unsolicited TEXT" sends a line now; "inject N TEXT" at byte N of the next exchange.
std::string CardSim::ControlLine(const std::string& command, const std::string& rest) {
    std::string text = rest;
    size_t at = 0;
    if (command == "inject") {
        char* end = nullptr;
        const long position = std::strtol(rest.c_str(), &end, 10);
        if (rest.empty() || end == rest.c_str() || position < 0 || position > 65536 ||
            (*end != ' ' && *end != '\t'))
            return "ERROR: inject needs a byte position and a line";
        at = static_cast<size_t>(position);
        text = AfterFirstWord(rest);
    }
    if (text.empty()) return "ERROR: " + command + " needs a line";
    if (command == "inject")
        engine_.InjectUnsolicited(text, at);
    else
        engine_.Unsolicited(text);
    return "OK";
}

std::string CardSim::Status() const {
    static const char* const kStates[] = {"active", "held", "dialing", "alerting", "incoming"};
    const int state = static_cast<int>(engine_.State());
    const EngineConfig& config = engine_.Config();
    std::ostringstream out;
    out << "inserted=" << (inserted_ ? 1 : 0) << " powered=" << (master_ >= 0 ? 1 : 0)
        << " call=" << (state < 0 ? "none" : kStates[state]);
    if (!engine_.CallNumber().empty()) out << " number=" << engine_.CallNumber();
    out << " signal=" << config.signalQuality << " operator=" << config.operatorCode
        << " firmware=" << config.firmware << " volume=" << engine_.Core().Volume()
        << " device=" << (slavePath_.empty() ? "-" : slavePath_)
        << " dialect=" << (engine_.Standard() ? "standard" : "card");
    if (engine_.Held()) out << " held=1";
    return out.str();
}

std::string CardSim::RunScript(const std::string& script, const std::function<void(int)>& wait) {
    std::istringstream lines(script);
    std::string line;
    for (int number = 1; std::getline(lines, line); ++number) {
        std::istringstream words(line);
        std::string command, argument;
        words >> command >> argument;
        if (command.empty() || command[0] == '#') continue;
        std::string result;
        if (command == "wait") {
            char* end = nullptr;
            long ms = std::strtol(argument.c_str(), &end, 10);
            if (argument.empty() || *end != '\0' || ms < 0) {
                result = "ERROR: wait needs milliseconds";
            } else if (wait) {
                wait(static_cast<int>(ms));
            } else {
                std::this_thread::sleep_for(std::chrono::milliseconds(ms));
            }
        } else {
            result = Control(line);
        }
        if (result.rfind("ERROR", 0) == 0) return "line " + std::to_string(number) + ": " + result;
    }
    return "OK";
}

// The kept state is a small text file, one "name value" a line, so that a user can read it
// and a damaged line costs only its own value.
void CardSim::LoadState() {
    std::ifstream file;
    if (!config_.stateFile.empty()) file.open(config_.stateFile);
    if (!file.is_open()) {
        // A card that has never run comes with the demo SIM.
        for (const auto& set : engine_.CommandSets())
            set->FillDemo();
        savedRevision_ = engine_.Revision();
        return;
    }
    std::string line;
    while (std::getline(file, line)) {
        std::istringstream words(line);
        std::string name, value;
        words >> name >> value;
        if (value.empty()) continue;
        const std::string rest = AfterFirstWord(line);
        bool owned = false;
        for (const auto& set : engine_.CommandSets())
            if ((owned = set->Load(name, rest))) break;
        if (owned) continue;
        const long number = std::strtol(value.c_str(), nullptr, 10);
        EngineConfig& config = engine_.ChangeConfig();
        if (name == "inserted") inserted_ = number != 0;
        if (name == "firmware") config.firmware = value;
        if (name == "signal") config.signalQuality = static_cast<int>(number);
        if (name == "operator") config.operatorCode = static_cast<int>(number);
        if (name == "busy") engine_.SetBusy(value);
        if (name == "unanswered") engine_.SetUnanswered(value);
    }
    savedRevision_ = engine_.Revision();
}

void CardSim::SaveState() {
    savedRevision_ = engine_.Revision();
    if (config_.stateFile.empty()) return;
    const EngineConfig& config = engine_.Config();
    std::ostringstream out;
    out << "inserted " << (inserted_ ? 1 : 0) << "\nfirmware " << config.firmware << "\nsignal "
        << config.signalQuality << "\noperator " << config.operatorCode << "\n";
    for (const std::string& number : engine_.Busy())
        out << "busy " << number << "\n";
    for (const std::string& number : engine_.Unanswered())
        out << "unanswered " << number << "\n";
    for (const auto& set : engine_.CommandSets())
        set->Save(out);
    std::error_code error;
    fs::create_directories(fs::path(config_.stateFile).parent_path(), error);
    ReplaceFile(config_.stateFile, out.str());
}

}  // namespace vqm::cardsim
