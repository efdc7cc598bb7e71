// vqm-dialer: the phone application. One instance per user: a second start brings the first
// window forward and exits.
#include <QApplication>
#include <cstdio>
#include <cstring>

#include "link/link.h"
#include "link/ports.h"
#include "shell/dialogs.h"
#include "shell/main_window.h"
#include "shell/messages.h"
#include "shell/view_factories.h"
#include "support/local_socket.h"
#include "support/settings_store.h"

namespace {

constexpr char kUsage[] =
    "Usage: vqm-dialer [--help | --version | --list-ports]\n"
    "The VQM Dialer: a phone on a GSM card modem.\n"
    "\n"
    "  --list-ports   list the active serial drivers (key, identity, device); the card is the\n"
    "                 first whose identity contains the PnpId setting\n"
    "  --version      the program's version\n"
    "\n"
    "The card manager (vqm-cardsim for the simulated card, vqm-commander for a real modem)\n"
    "must be running; the dialer asks it to power the card up. F9 switches the display off\n"
    "and on where the display supports it.\n";

int ListPorts() {
    vqm::SettingsStore settings;
    vqm::PrintActiveDrivers(settings, vqm::DefaultDriverRoots());
    return 0;
}

}  // namespace

int main(int argc, char** argv) {
    for (int i = 1; i < argc; ++i) {
        if (!std::strcmp(argv[i], "--help") || !std::strcmp(argv[i], "-h")) {
            std::fputs(kUsage, stdout);
            return 0;
        }
        if (!std::strcmp(argv[i], "--version")) {
            std::puts("vqm-dialer 2.01");
            return 0;
        }
        if (!std::strcmp(argv[i], "--list-ports")) return ListPorts();
    }

    const std::string runtimeRoot = vqm::DefaultRuntimeRoot();
    const std::string instancePath = vqm::WindowSocketPath(runtimeRoot, vqm::kMainWindowClass);
    if (vqm::SendWindowMessage(instancePath, vqm::kMsgBringForward, 0, 0, 2000)) return 0;

    QApplication app(argc, argv);
    QApplication::setApplicationName("VQM Dialer");
    vqm::SettingsStore settings;
    vqm::Link link(settings, vqm::DefaultDriverRoots());
    vqm::Dialogs dialogs;
    vqm::ShellContext context{settings, link, dialogs, runtimeRoot};
    vqm::MainWindow window(context, vqm::DefaultViewFactories());

    // The first instance answers later starts, on the window's own thread.
    vqm::LineServer instance;
    if (!instance.Start(instancePath, [&](const std::string& line) {
            return vqm::AnswerWindowMessage(line, [&](unsigned msg, long w, long l) {
                return window.Messages().Send(&window, msg, w, l);
            });
        }))
        return 0;  // another dialer started at the same moment
    window.show();
    const int result = QApplication::exec();
    instance.Stop();
    return result;
}
