// vqm-cardsim: the simulated card as a program. It serves the card on a pseudo-terminal,
// answers the dialer as the card manager, and takes network-side commands from a socket
// ("vqm-cardsim ctl ...") and from a script file.
#include <signal.h>

#include <condition_variable>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <fstream>
#include <sstream>
#include <string>
#include <thread>

#include "cardsim/card_sim.h"
#include "cardsim/companion.h"
#include "support/local_socket.h"

namespace {

using vqm::cardsim::CardSim;
using vqm::cardsim::Clock;
using vqm::cardsim::Companion;

constexpr char kUsage[] =
    "Usage: vqm-cardsim [OPTIONS]          serve the simulated card until stopped\n"
    "       vqm-cardsim ctl COMMAND [ARG]  send one command to the running card\n"
    "\n"
    "Options:\n"
    "  --powered             start powered up (otherwise the dialer asks to power it up)\n"
    "  --power-up-ms N       how long a power-up takes (default 3000)\n"
    "  --baud N              line rate of the card's output (default 19200, 0 unpaced)\n"
    "  --firmware VERSION    SW4.00 (default) or e.g. SW3.80\n"
    "  --dialect card|standard\n"
    "                        card (default): the card's own dialect. standard: a plain\n"
    "                        27.007 modem: no echo whatever ATE says, +GMR \"REV1\",\n"
    "                        +COPS? with the long name until AT+COPS=3,2 (then the quoted\n"
    "                        code), +CLIP: \"<digits>\",145,,,,0, RING or +CRING as +CRC\n"
    "                        says, +CME ERROR: <n> (+CMEE=1 from the start), *ECAV: after\n"
    "                        every change of a call, ^RSSI:/+CREG: when signal or network\n"
    "                        change, and unsolicited lines sent at once, even while a\n"
    "                        command is typed or between the lines of a reply\n"
    "  --noise-ms N          standard dialect: a vendor line (^RSSI:, +CREG:, ^MODE:)\n"
    "                        every N ms, 0 never (default 10000)\n"
    "  --dial-delay-ms N     time until the far end decides on a call (default 2000)\n"
    "  --script FILE         run control commands from FILE (\"wait MS\" pauses, # comments)\n"
    "  --state-dir DIR       where the card keeps its state between runs\n"
    "                        (default $XDG_STATE_HOME/VQMFull/cardsim)\n"
    "  --runtime-dir DIR     where the sockets and the driver entry go\n"
    "                        (default $XDG_RUNTIME_DIR/VQMFull)\n"
    "  --help                this text\n"
    "  --version             the program's version\n"
    "\n"
    "Control commands (also in scripts):\n";

std::string DefaultStateDir() {
    const char* state = std::getenv("XDG_STATE_HOME");
    const char* home = std::getenv("HOME");
    std::string base = state && *state ? state : std::string(home ? home : ".") + "/.local/state";
    return base + "/VQMFull/cardsim";
}

std::string ControlSocketPath(const std::string& runtimeDir) {
    return runtimeDir + "/cardsim.ctl";
}

bool ParseNumber(const char* text, int* value) {
    char* end = nullptr;
    long parsed = std::strtol(text, &end, 10);
    if (end == text || *end != '\0' || parsed < 0 || parsed > 10'000'000) return false;
    *value = static_cast<int>(parsed);
    return true;
}

int SendControl(const std::string& runtimeDir, int argc, char** argv, int first) {
    std::string line;
    for (int i = first; i < argc; ++i)
        line += (line.empty() ? "" : " ") + std::string(argv[i]);
    if (line.empty()) {
        std::fprintf(stderr, "vqm-cardsim ctl: which command? See vqm-cardsim --help.\n");
        return 2;
    }
    auto reply = vqm::SendLine(ControlSocketPath(runtimeDir), line, 10000);
    if (!reply) {
        std::fprintf(stderr, "vqm-cardsim ctl: no simulated card is running (%s)\n",
                     ControlSocketPath(runtimeDir).c_str());
        return 2;
    }
    std::printf("%s\n", reply->c_str());
    return reply->rfind("OK", 0) == 0 ? 0 : 1;
}

}  // namespace

int main(int argc, char** argv) {
    vqm::cardsim::SimConfig config;
    config.runtimeDir = vqm::DefaultRuntimeRoot();
    std::string stateDir = DefaultStateDir(), scriptPath, firmware;
    bool powered = false;
    int powerUpMs = 3000, noiseMs = 10000;
    for (int i = 1; i < argc; ++i) {
        const std::string option = argv[i];
        const bool hasValue = i + 1 < argc;
        if (option == "--help" || option == "-h") {
            std::printf("%s%s", kUsage, CardSim::ControlHelp().c_str());
            return 0;
        } else if (option == "--version") {
            std::puts("vqm-cardsim 2.01");
            return 0;
        } else if (option == "ctl") {
            return SendControl(config.runtimeDir, argc, argv, i + 1);
        } else if (option == "--powered") {
            powered = true;
        } else if (option == "--runtime-dir" && hasValue) {
            config.runtimeDir = argv[++i];
        } else if (option == "--state-dir" && hasValue) {
            stateDir = argv[++i];
        } else if (option == "--script" && hasValue) {
            scriptPath = argv[++i];
        } else if (option == "--firmware" && hasValue) {
            firmware = argv[++i];
        } else if (option == "--dialect" && hasValue &&
                   (std::strcmp(argv[i + 1], "card") == 0 ||
                    std::strcmp(argv[i + 1], "standard") == 0)) {
            config.engine.dialect = std::strcmp(argv[++i], "standard") == 0
                                        ? vqm::cardsim::Dialect::Standard
                                        : vqm::cardsim::Dialect::Card;
        } else if (option == "--baud" && hasValue && ParseNumber(argv[i + 1], &config.baud)) {
            ++i;
        } else if (option == "--power-up-ms" && hasValue && ParseNumber(argv[i + 1], &powerUpMs)) {
            ++i;
        } else if (option == "--noise-ms" && hasValue && ParseNumber(argv[i + 1], &noiseMs)) {
            ++i;
        } else if (option == "--dial-delay-ms" && hasValue &&
                   ParseNumber(argv[i + 1], &config.engine.dialDelayMs)) {
            ++i;
        } else {
            std::fprintf(stderr, "vqm-cardsim: bad option '%s'. See vqm-cardsim --help.\n",
                         argv[i]);
            return 2;
        }
    }
    std::string script;
    if (!scriptPath.empty()) {
        std::ifstream file(scriptPath);
        if (!file) {
            std::fprintf(stderr, "vqm-cardsim: cannot read the script %s\n", scriptPath.c_str());
            return 2;
        }
        std::ostringstream text;
        text << file.rdbuf();
        script = text.str();
    }

    // Signals are taken by the main loop only, so every thread started below ignores them.
    sigset_t stopSignals;
    sigemptyset(&stopSignals);
    for (int signal : {SIGINT, SIGTERM, SIGHUP})
        sigaddset(&stopSignals, signal);
    pthread_sigmask(SIG_BLOCK, &stopSignals, nullptr);

    config.stateFile = stateDir + "/card.state";
    config.engine.vendorNoiseMs = noiseMs;
    CardSim card(config);
    if (!firmware.empty()) card.Control("firmware " + firmware);
    Companion companion(card, powerUpMs);

    vqm::LineServer companionServer, controlServer;
    const std::string companionPath =
        vqm::WindowSocketPath(config.runtimeDir, vqm::kCompanionClass);
    if (vqm::ServerAnswers(companionPath)) {
        std::fprintf(stderr, "vqm-cardsim: a card manager already answers at %s\n",
                     companionPath.c_str());
        return 1;
    }
    // Powered before the sockets answer, so that whoever finds them finds the card as asked.
    if (powered && !card.PowerUp())
        std::fprintf(stderr, "vqm-cardsim: cannot power up (card pulled, or no pseudo-terminal)\n");
    if (!companionServer.Start(companionPath, [&](const std::string& line) {
            return vqm::AnswerWindowMessage(line, [&](unsigned msg, long w, long l) {
                return companion.OnMessage(msg, w, l, Clock::now());
            });
        })) {
        std::fprintf(stderr, "vqm-cardsim: a card manager already answers at %s\n",
                     companionPath.c_str());
        return 1;
    }
    if (!controlServer.Start(ControlSocketPath(config.runtimeDir),
                             [&](const std::string& line) { return card.Control(line); })) {
        std::fprintf(stderr, "vqm-cardsim: cannot serve %s\n",
                     ControlSocketPath(config.runtimeDir).c_str());
        return 1;
    }

    std::mutex stopMutex;
    std::condition_variable stopped;
    bool stopping = false;
    std::thread scriptThread;
    if (!script.empty()) {
        scriptThread = std::thread([&] {
            std::string result = card.RunScript(script, [&](int ms) {
                std::unique_lock<std::mutex> lock(stopMutex);
                stopped.wait_for(lock, std::chrono::milliseconds(ms), [&] { return stopping; });
            });
            if (result != "OK")
                std::fprintf(stderr, "vqm-cardsim: %s: %s\n", scriptPath.c_str(), result.c_str());
        });
    }

    std::printf("vqm-cardsim: card manager at %s, control at %s\n", companionPath.c_str(),
                ControlSocketPath(config.runtimeDir).c_str());
    std::fflush(stdout);
    std::string shownDevice = "?";
    const timespec tick{0, 100'000'000};
    for (;;) {
        const int signal = sigtimedwait(&stopSignals, nullptr, &tick);
        if (signal > 0) break;
        companion.Tick(Clock::now());
        const std::string device = card.DevicePath();
        if (device != shownDevice) {
            if (device.empty())
                std::printf("vqm-cardsim: card %s\n",
                            card.Inserted() ? "powered down" : "pulled out");
            else
                std::printf("vqm-cardsim: card powered up on %s\n", device.c_str());
            std::fflush(stdout);
            shownDevice = device;
        }
    }
    {
        std::lock_guard<std::mutex> lock(stopMutex);
        stopping = true;
    }
    stopped.notify_all();
    controlServer.Stop();
    companionServer.Stop();
    if (scriptThread.joinable()) scriptThread.join();
    card.PowerDown();
    return 0;
}
