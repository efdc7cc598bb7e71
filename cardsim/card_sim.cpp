#include "cardsim/card_sim.h"

#include <fcntl.h>
#include <poll.h>
#include <stdlib.h>
#include <unistd.h>

#include <filesystem>
#include <fstream>
#include <sstream>

namespace vqm::cardsim {

namespace fs = std::filesystem;

CardSim::CardSim(SimConfig config) : config_(std::move(config)), engine_(config_.engine) {}

CardSim::~CardSim() {
    PowerDown();
}

std::string CardSim::DevicePath() const {
    std::lock_guard<std::mutex> lock(mutex_);
    return slavePath_;
}

bool CardSim::PowerUp() {
    if (Powered()) return true;
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
    Unregister();
    stop_ = true;
    if (worker_.joinable()) worker_.join();
    std::lock_guard<std::mutex> lock(mutex_);
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
    while (!stop_) {
        int fd;
        {
            std::lock_guard<std::mutex> lock(mutex_);
            fd = master_;
        }
        if (fd < 0) return;
        pollfd p{fd, POLLIN, 0};
        // Wake often enough for the engine's timers and to keep sending at the line rate.
        int ready = poll(&p, 1, pending.empty() ? 5 : 0);
        char buffer[256];
        ssize_t n = ready > 0 && (p.revents & POLLIN) ? read(fd, buffer, sizeof buffer) : 0;
        {
            std::lock_guard<std::mutex> lock(mutex_);
            const auto now = Clock::now();
            if (n > 0) engine_.Feed(buffer, static_cast<size_t>(n), now);
            engine_.Tick(now);
            pending += engine_.TakeOutput();
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
    if (command == "pull" || command == "power-down") {
        PowerDown();
        return "OK";
    }
    if (command == "power-up" || command == "insert")
        return PowerUp() ? "OK" : "ERROR: no pseudo-terminal";
    std::lock_guard<std::mutex> lock(mutex_);
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
        char* end = nullptr;
        long value = std::strtol(argument.c_str(), &end, 10);
        if (argument.empty() || *end != '\0') return needs("a number");
        (command == "signal" ? engine_.Config().signalQuality : engine_.Config().operatorCode) =
            static_cast<int>(value);
    } else if (command == "firmware") {
        if (argument.empty()) return needs("a version such as SW3.80");
        engine_.Config().firmware = argument.rfind("SW", 0) == 0 ? argument : "SW" + argument;
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

}  // namespace vqm::cardsim
