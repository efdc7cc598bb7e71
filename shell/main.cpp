// vqm-dialer: the phone application. One instance per user: a second start brings the first
// window forward and exits.
#include <signal.h>
#include <sys/signalfd.h>
#include <unistd.h>

#include <QApplication>
#include <QSocketNotifier>
#include <cstdio>
#include <cstring>
#include <memory>

#include "calls/call_log.h"
#include "contacts/phonebook_cache.h"
#include "link/link.h"
#include "link/ports.h"
#include "shell/dialogs.h"
#include "shell/main_window.h"
#include "shell/messages.h"
#include "shell/phone_requests.h"
#include "shell/stall_meter.h"
#include "shell/ui_log.h"
#include "shell/view_factories.h"
#include "support/local_socket.h"
#include "support/settings_store.h"

namespace {

constexpr char kUsage[] =
    "Usage: vqm-dialer [--ui-log FILE] [--answer-boxes ok|cancel] [--dialog-fields FILE]\n"
    "                  [--stall-log FILE]\n"
    "       vqm-dialer --help | --version | --list-ports\n"
    "The VQM Dialer: a phone on a GSM card modem.\n"
    "\n"
    "  --list-ports   list the active serial drivers (key, identity, device); the card is the\n"
    "                 first whose identity contains the PnpId setting\n"
    "  --version      the program's version\n"
    "  --ui-log FILE  append a line to FILE for each status text, card state change, message\n"
    "                 box and dialog the dialer shows\n"
    "  --answer-boxes ok|cancel\n"
    "                 for scripted runs: answer every message box and dialog at once\n"
    "  --dialog-fields FILE\n"
    "                 with --answer-boxes: fill the next dialog from FILE first (one line: its\n"
    "                 name, then ID=text and ID to click; the file is removed once used)\n"
    "  --stall-log FILE\n"
    "                 for the figures: append a line to FILE each time the window's thread\n"
    "                 is kept from its events for 2 ms or more (a 5 ms timer comes late)\n"
    "\n"
    "The card manager (vqm-cardsim for the simulated card, vqm-commander for a real modem)\n"
    "must be running; the dialer asks it to power the card up. F9 switches the display off\n"
    "and on where the display supports it.\n";

int ParseAnswer(const char* text) {
    if (!std::strcmp(text, "ok")) return vqm::kIdOk;
    if (!std::strcmp(text, "cancel")) return vqm::kIdCancel;
    return 0;
}

int ListPorts() {
    vqm::SettingsStore settings;
    vqm::PrintActiveDrivers(settings, vqm::DefaultDriverRoots());
    return 0;
}

}  // namespace

int main(int argc, char** argv) {
    std::string uiLogPath, stallLogPath, dialogFieldsPath;
    int autoAnswer = 0;
    for (int i = 1; i < argc; ++i) {
        const bool hasValue = i + 1 < argc;
        if (!std::strcmp(argv[i], "--help") || !std::strcmp(argv[i], "-h")) {
            std::fputs(kUsage, stdout);
            return 0;
        } else if (!std::strcmp(argv[i], "--version")) {
            std::puts("vqm-dialer 2.01");
            return 0;
        } else if (!std::strcmp(argv[i], "--list-ports")) {
            return ListPorts();
        } else if (!std::strcmp(argv[i], "--ui-log") && hasValue) {
            uiLogPath = argv[++i];
        } else if (!std::strcmp(argv[i], "--stall-log") && hasValue) {
            stallLogPath = argv[++i];
        } else if (!std::strcmp(argv[i], "--dialog-fields") && hasValue) {
            dialogFieldsPath = argv[++i];
        } else if (!std::strcmp(argv[i], "--answer-boxes") && hasValue &&
                   (autoAnswer = ParseAnswer(argv[i + 1]))) {
            ++i;
        } else if (argv[i][0] == '-' && argv[i][1] == '-') {
            std::fprintf(stderr, "vqm-dialer: bad option '%s'. See vqm-dialer --help.\n", argv[i]);
            return 2;
        }
        // Anything else is left to Qt (-platform, -geometry, ...).
    }

    const std::string runtimeRoot = vqm::DefaultRuntimeRoot();
    const std::string instancePath = vqm::WindowSocketPath(runtimeRoot, vqm::kMainWindowClass);
    if (vqm::SendWindowMessage(instancePath, vqm::kMsgBringForward, 0, 0, 2000)) return 0;

    // Stop signals are taken by the window's own thread (below), so every thread Qt starts
    // must inherit them blocked.
    sigset_t stopSignals;
    sigemptyset(&stopSignals);
    for (int signal : {SIGINT, SIGTERM, SIGHUP})
        sigaddset(&stopSignals, signal);
    pthread_sigmask(SIG_BLOCK, &stopSignals, nullptr);

    QApplication app(argc, argv);
    QApplication::setApplicationName("VQM Dialer");
    vqm::SettingsStore settings;
    vqm::Link link(settings, vqm::DefaultDriverRoots());
    vqm::UiLog uiLog(uiLogPath);
    vqm::StallMeter stallMeter(stallLogPath);
    vqm::Dialogs dialogs;
    dialogs.SetLog(&uiLog);
    dialogs.SetAutoAnswer(autoAnswer);
    dialogs.SetFieldsFile(dialogFieldsPath);
    vqm::CallLog callLog(settings);
    vqm::PhonebookCaches caches(settings);
    vqm::ShellContext context{settings, link, dialogs, runtimeRoot};
    context.uiLog = &uiLog;
    context.callLog = &callLog;
    context.caches = &caches;
    // vqm-phone's requests; made once the window is up, and gone only after the window, whose
    // DialPad worker may still queue the exit's hang-up reply through the link's event feed.
    std::unique_ptr<vqm::PhoneRequests> phone;
    vqm::MainWindow window(context, vqm::DefaultViewFactories());

    // Ctrl-C or a stop from the session ends the dialer as "Exit" does: the call is hung up
    // and the card is left as it was.
    const int stopFd = signalfd(-1, &stopSignals, SFD_CLOEXEC | SFD_NONBLOCK);
    QSocketNotifier stopNotifier(stopFd, QSocketNotifier::Read);
    QObject::connect(&stopNotifier, &QSocketNotifier::activated, &window, [&] {
        signalfd_siginfo info;
        while (read(stopFd, &info, sizeof info) == sizeof info) {
        }
        window.Command(vqm::kCmdExit);
    });

    // vqm-phone's commands run on the socket's thread, on the dialer's link.
    phone = std::make_unique<vqm::PhoneRequests>(
        link, settings, &callLog, &caches, vqm::WindowSocketPath(runtimeRoot, vqm::kCompanionClass),
        [&] { window.Messages().Post(&window, vqm::kMsgRefreshLists, 0, 0); });

    // The first instance answers later starts, on the window's own thread.
    vqm::LineServer instance;
    if (!instance.Start(instancePath, [&](const std::string& line) {
            if (vqm::PhoneRequests::IsRequest(line)) return phone->Answer(line);
            return vqm::AnswerWindowMessage(line, [&](unsigned msg, long w, long l) {
                return window.Messages().Send(&window, msg, w, l);
            });
        }))
        return 0;  // another dialer started at the same moment
    window.show();
    const int result = QApplication::exec();
    instance.Stop();
    close(stopFd);
    return result;
}
