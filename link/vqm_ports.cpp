// vqm-ports: lists every active serial driver with its identity text and device, so that a
// user can choose the "PnpId" that finds the card (vqm-settings set PnpId TEXT).
#include <cstdio>
#include <cstring>

#include "link/ports.h"
#include "support/settings_store.h"

int main(int argc, char** argv) {
    if (argc > 1 && (std::strcmp(argv[1], "--help") == 0 || std::strcmp(argv[1], "-h") == 0)) {
        std::puts(
            "Usage: vqm-ports\nLists the active serial drivers: key, identity, device.\n"
            "The card is the first whose identity contains the PnpId setting.\n\n"
            "  --help      show this text\n"
            "  --version   show the program's version");
        return 0;
    }
    if (argc > 1 && std::strcmp(argv[1], "--version") == 0) {
        std::puts("vqm-ports 2.01");
        return 0;
    }
    vqm::SettingsStore settings;
    vqm::PrintActiveDrivers(settings, vqm::DefaultDriverRoots());
    return 0;
}
