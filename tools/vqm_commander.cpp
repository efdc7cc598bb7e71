// vqm-commander: the card manager for a real modem. A USB or serial GSM modem is powered while
// it is plugged in, so this companion only reports what the dialer asks about: the card is
// "powered and ready" while its device exists, "powered down" otherwise. A power-up request
// cannot switch a modem on; it answers whether the modem is there.
#include <signal.h>
#include <unistd.h>

#include <cstdio>
#include <cstring>
#include <string>

#include "link/ports.h"
#include "support/local_socket.h"
#include "support/settings_store.h"

namespace {

constexpr char kUsage[] =
    "Usage: vqm-commander [--device PATH] [--runtime-dir DIR]\n"
    "The card manager for a real GSM modem: it tells the VQM Dialer that the card is powered\n"
    "and ready while the modem is plugged in.\n"
    "\n"
    "  --device PATH       the modem's device (e.g. /dev/ttyUSB2); by default the first\n"
    "                      active serial driver whose identity contains the PnpId setting\n"
    "                      (see vqm-dialer --list-ports)\n"
    "  --runtime-dir DIR   where the card manager's socket goes (default\n"
    "                      $XDG_RUNTIME_DIR/VQMFull)\n"
    "  --help              this text\n"
    "  --version           the program's version\n";

}  // namespace

int main(int argc, char** argv) {
    std::string device;
    vqm::DriverRoots roots = vqm::DefaultDriverRoots();
    for (int i = 1; i < argc; ++i) {
        const bool hasValue = i + 1 < argc;
        if (!std::strcmp(argv[i], "--help") || !std::strcmp(argv[i], "-h")) {
            std::fputs(kUsage, stdout);
            return 0;
        } else if (!std::strcmp(argv[i], "--version")) {
            std::puts("vqm-commander 2.01");
            return 0;
        } else if (!std::strcmp(argv[i], "--device") && hasValue) {
            device = argv[++i];
        } else if (!std::strcmp(argv[i], "--runtime-dir") && hasValue) {
            roots.runtimeRoot = argv[++i];
        } else {
            std::fprintf(stderr, "vqm-commander: bad option '%s'. See vqm-commander --help.\n",
                         argv[i]);
            return 2;
        }
    }

    sigset_t stopSignals;
    sigemptyset(&stopSignals);
    for (int signal : {SIGINT, SIGTERM, SIGHUP})
        sigaddset(&stopSignals, signal);
    pthread_sigmask(SIG_BLOCK, &stopSignals, nullptr);

    vqm::SettingsStore settings;
    auto present = [&]() -> long {
        if (!device.empty()) return access(device.c_str(), F_OK) == 0 ? 1 : 0;
        return vqm::CardPresent(settings, roots);
    };
    const std::string path = vqm::WindowSocketPath(roots.runtimeRoot, vqm::kCompanionClass);
    vqm::LineServer server;
    if (vqm::ServerAnswers(path) || !server.Start(path, [&](const std::string& line) {
            return vqm::AnswerWindowMessage(line, [&](unsigned msg, long, long) -> long {
                switch (msg) {
                    case vqm::kMsgCardPowerQuery:
                    case vqm::kMsgCardPowerUp:
                        return present();
                    case vqm::kMsgCardPowerDown:
                    case vqm::kMsgSimFullCleared:
                        return 1;  // nothing to do for a modem that powers itself
                    default:
                        return 0;
                }
            });
        })) {
        std::fprintf(stderr, "vqm-commander: a card manager already answers at %s\n", path.c_str());
        return 1;
    }
    std::printf("vqm-commander: card manager at %s for %s\n", path.c_str(),
                device.empty() ? "the modem named by PnpId" : device.c_str());
    std::fflush(stdout);
    int signal = 0;
    sigwait(&stopSignals, &signal);
    server.Stop();
    return 0;
}
