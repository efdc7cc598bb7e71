// vqm-phone: the phone from a shell or a script. While the dialer runs it holds the card's
// port, so the commands go to it through its socket and run on its link; otherwise vqm-phone
// finds and opens the port itself, as the dialer would.
#include <signal.h>
#include <unistd.h>

#include <atomic>
#include <cstdio>
#include <cstring>
#include <optional>
#include <string>
#include <vector>

#include "link/link.h"
#include "link/ports.h"
#include "support/local_socket.h"
#include "support/settings_store.h"
#include "tools/phone_commands.h"

namespace {

using namespace vqm::phone;

constexpr char kUsage[] =
    "Usage: vqm-phone [--json] COMMAND [ARGUMENTS]\n"
    "       vqm-phone --help | --version\n"
    "The VQM Dialer's phone from the command line.\n"
    "\n"
    "Commands:\n"
    "  status                          card, power, operator, signal bars, firmware\n"
    "  dial NUMBER                     make a voice call\n"
    "  hangup                          end the call\n"
    "  answer                          answer a ringing call\n"
    "  sms list [--folder F]           list a folder: inbox (default), outbox, sent, draft, pc\n"
    "  sms read N [--folder F]         show message N of a folder\n"
    "  sms send NUMBER... --text TEXT  send TEXT to each NUMBER (--text - reads stdin);\n"
    "                                  at most 160 characters, or 70 with characters outside\n"
    "                                  the GSM alphabet; filed on the Sent page\n"
    "  sms delete N [--folder F]       delete message N of a folder\n"
    "  contacts list [--sim|--card|--desktop]\n"
    "                                  list contacts (all three by default)\n"
    "  contacts export --vcard FILE [--sim|--card]\n"
    "                                  write the SIM and card contacts as vCards\n"
    "  contacts import --vcard FILE [--sim|--card]\n"
    "                                  add the contacts of FILE to the SIM (default) or card;\n"
    "                                  nothing is written unless all of them fit\n"
    "  calllog [answered|dialed|unanswered]\n"
    "                                  the call log\n"
    "  events                          rings, caller ids and new messages, one line each,\n"
    "                                  until stopped (Ctrl-C)\n"
    "\n"
    "  --json     output for scripts: one JSON object or array (events: one object a line)\n"
    "\n"
    "While vqm-dialer runs, the commands run in the dialer, which holds the card's port;\n"
    "otherwise vqm-phone opens the card's port itself (the PnpId setting names the card).\n"
    "\n"
    "Exit status: 0 done, 1 the card refused (or a file could not be written), 2 bad usage\n"
    "or bad input (number, text, vCard file), 3 no card.\n";

std::atomic<bool> stopRequested{false};

void OnStop(int) {
    stopRequested = true;
}

int Print(const Result& result) {
    std::fputs(result.out.c_str(), stdout);
    std::fputs(result.err.c_str(), stderr);
    return result.code;
}

int Usage(const std::string& error) {
    std::fprintf(stderr, "vqm-phone: %s\nSee vqm-phone --help.\n", error.c_str());
    return kExitUsage;
}

// Reads the message text from stdin, but never more than the longest text taken: a larger
// input is refused without being read to its end.
bool ReadStdinText(std::string* text) {
    text->clear();
    char buffer[1024];
    size_t n;
    while ((n = std::fread(buffer, 1, sizeof buffer, stdin)) > 0) {
        text->append(buffer, n);
        if (text->size() > kMaxTextBytes + 2) return false;
    }
    // The line end that echo and here-documents add is not part of the message.
    if (!text->empty() && text->back() == '\n') text->pop_back();
    if (!text->empty() && text->back() == '\r') text->pop_back();
    return text->size() <= kMaxTextBytes;
}

// Said on stderr once events are followed, so that a script knows when to go on.
void SayFollowing() {
    std::fputs("vqm-phone: following the card's events; Ctrl-C stops.\n", stderr);
    std::fflush(stderr);
}

int FollowDialerEvents(const std::string& socket, bool json) {
    std::vector<std::string> first = {"events-since", "now"};
    if (json) first.push_back("--json");
    auto reply = vqm::SendLine(socket, EncodeRequest(first), 10000);
    Result result;
    uint64_t cursor = 0;
    if (!reply || !DecodeReply(*reply, &result, &cursor)) {
        std::fputs("vqm-phone: the dialer did not answer.\n", stderr);
        return kExitNoCard;
    }
    SayFollowing();
    while (!stopRequested) {
        // A short pause between polls: the dialer's socket serves one request at a time, so a
        // request that waited for an event would hold up every other client.
        usleep(200 * 1000);
        std::vector<std::string> args = {"events-since", std::to_string(cursor)};
        if (json) args.push_back("--json");
        reply = vqm::SendLine(socket, EncodeRequest(args), 10000);
        if (!reply) {
            if (!vqm::ServerAnswers(socket)) {
                std::fputs("vqm-phone: the dialer has gone.\n", stderr);
                return kExitNoCard;
            }
            continue;
        }
        if (!DecodeReply(*reply, &result, &cursor)) continue;
        std::fputs(result.out.c_str(), stdout);
        std::fflush(stdout);
    }
    return kExitDone;
}

int FollowOwnEvents(vqm::Link& link, EventFeed& feed, bool json) {
    uint64_t cursor = feed.Last();
    SayFollowing();
    while (!stopRequested && link.portState.load() > 0) {
        if (!feed.WaitAfter(cursor, 200)) continue;
        for (const Event& event : feed.Since(cursor, &cursor))
            std::fputs(FormatEvent(event, json).c_str(), stdout);
        std::fflush(stdout);
    }
    return link.portState.load() > 0 ? kExitDone : kExitNoCard;
}

}  // namespace

int main(int argc, char** argv) {
    std::vector<std::string> args(argv + 1, argv + argc);
    for (const std::string& a : args) {
        if (a == "--help" || a == "-h") {
            std::fputs(kUsage, stdout);
            return 0;
        }
        if (a == "--version") {
            std::puts("vqm-phone 2.01");
            return 0;
        }
    }
    Command command;
    std::string error;
    if (ParseCommand(args, &command, &error) != kExitDone) return Usage(error);
    signal(SIGPIPE, SIG_IGN);

    if (command.textFromStdin) {
        if (!ReadStdinText(&command.text))
            return Usage("the message text on stdin is too long for a short message");
        command.textFromStdin = false;
    }
    if (CheckInputs(command, &error) != kExitDone) return Usage(error);

    struct sigaction stop {};
    stop.sa_handler = OnStop;
    sigaction(SIGINT, &stop, nullptr);
    sigaction(SIGTERM, &stop, nullptr);

    const std::string runtimeRoot = vqm::DefaultRuntimeRoot();
    const std::string dialer = vqm::WindowSocketPath(runtimeRoot, "DIALERAPP_CLASS");
    if (vqm::ServerAnswers(dialer)) {
        if (command.verb == Verb::Events) return FollowDialerEvents(dialer, command.json);
        // A long network operation (a message to several people, a slow SIM) takes a while.
        auto reply = vqm::SendLine(dialer, EncodeRequest(CommandArguments(command)), 300000);
        Result result;
        if (!reply) {
            std::fputs("vqm-phone: the dialer did not answer.\n", stderr);
            return kExitNoCard;
        }
        if (!DecodeReply(*reply, &result)) {
            std::fputs("vqm-phone: the running dialer does not take phone commands.\n", stderr);
            return kExitNoCard;
        }
        return Print(result);
    }

    vqm::SettingsStore settings;
    vqm::Link link(settings, vqm::DefaultDriverRoots());
    Context context{link, settings};
    context.companionPath = vqm::WindowSocketPath(runtimeRoot, vqm::kCompanionClass);
    if (!NeedsCard(command)) return Print(Run(context, command));
    if (!vqm::CardPresent(settings, link.roots)) {
        std::fputs(
            "vqm-phone: no card: no active serial driver matches the PnpId setting "
            "(see vqm-dialer --list-ports).\n",
            stderr);
        return kExitNoCard;
    }
    EventFeed feed(link);
    if (command.verb == Verb::Events) link.events = &feed;
    if (!vqm::PortOpen(link)) {
        std::fputs(
            "vqm-phone: no card: its port cannot be opened, or the card does not "
            "answer.\n",
            stderr);
        return kExitNoCard;
    }
    int code;
    if (command.verb == Verb::Events)
        code = FollowOwnEvents(link, feed, command.json);
    else
        code = Print(Run(context, command));
    vqm::PortClose(link);
    link.events = nullptr;
    return code;
}
