// vqm-messaging-bench: two figures of the message store.
// 1. The SIM refresh of a full 50-message SIM at 19200 baud (select the memories, PDU mode, then
//    one AT+CMGR per location), as a ratio to the floor of the link's own rules for the same
//    exchanges: every byte on the line (command, echo, reply) at 10 bits a byte, plus per
//    exchange the 100 ms wait for the first reply byte and the 200 ms of silence that ends the
//    reply. Target ratio: at most 1.10.
// 2. Listing a 1,000-message handheld folder into the SMS Folder view (read, sort, fill the
//    lists), offscreen. Target: under 100 ms.
#include <QApplication>
#include <algorithm>
#include <chrono>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <string>
#include <vector>

#include "bench/bench_card.h"
#include "messaging/message_store.h"
#include "messaging/sms_folder_view.h"
#include "shell/dialogs.h"
#include "support/text.h"

namespace {

constexpr int kSimMessages = 50;
constexpr int kLocalMessages = 1000;

using Clock = std::chrono::steady_clock;

double Ms(Clock::time_point start) {
    return std::chrono::duration<double, std::milli>(Clock::now() - start).count();
}

std::vector<std::string> RefreshCommands() {
    std::vector<std::string> commands = {"AT+CPMS=\"SM\",\"SM\",\"SM\"\r", "AT+CMGF=0\r"};
    for (int location = 1; location <= kSimMessages; ++location)
        commands.push_back("AT+CMGR=" + std::to_string(location) + "\r");
    return commands;
}

int RefreshFigure(int baud, int iterations) {
    vqm::bench::BenchCard bench(baud, {}, [](vqm::cardsim::CardSim& card) {
        if (card.Control("capacity " + std::to_string(kSimMessages)) != "OK") return false;
        // The demo SIM's four, then deliveries up to the capacity.
        for (int i = 5; i <= kSimMessages; ++i)
            if (card.Control("deliver +4477009" + std::to_string(10000 + i) + " Message number " +
                             std::to_string(i) +
                             " of the full SIM, long enough to be a typical text") != "OK")
                return false;
        return true;
    });
    if (!bench.Up()) {
        std::fprintf(stderr, "vqm-messaging-bench: the simulated card did not come up\n");
        return 1;
    }
    vqm::Link& link = bench.GetLink();
    double floorMs = 0;
    size_t lineBytes = 0;
    const std::vector<std::string> commands = RefreshCommands();
    for (const std::string& command : commands) {
        char reply[vqm::kSmsReadReplySize];
        const unsigned length = vqm::AtCommand(link, command.c_str(), reply, sizeof reply);
        const size_t bytes = 2 * command.size() + length;
        lineBytes += bytes;
        floorMs += vqm::bench::LineFloorMs(static_cast<double>(bytes), baud);
    }
    vqm::SetSettingString(bench.Settings(), u"InstallPath",
                          vqm::Utf8ToUtf16(bench.Folder() + "/").c_str());
    vqm::MessageStore store(bench.Settings());
    vqm::StoreGuardCreate(store);
    std::vector<double> times;
    int filed = 0;
    for (int i = 0; i < iterations; ++i) {
        std::remove(vqm::StoreFolderPath(store, vqm::kFolderSim).c_str());
        const auto start = Clock::now();
        filed = vqm::StoreRefreshSim(store, link);
        times.push_back(Ms(start));
    }
    const double median = vqm::bench::Median(times);
    const double ratio = median / floorMs;
    std::printf("%-28s %9s %7s %10s %10s %10s %7s\n", "transaction", "exchanges", "bytes",
                "floor ms", "median ms", "worst ms", "ratio");
    std::printf("%-28s %9zu %7zu %10.1f %10.1f %10.1f %7.3f\n", "SIM refresh (50 messages)",
                commands.size(), lineBytes, floorMs, median,
                *std::max_element(times.begin(), times.end()), ratio);
    std::printf("messages filed: %d of %d\n", filed, kSimMessages);
    return filed == kSimMessages && ratio <= 1.10 ? 0 : 1;
}

int ListingFigure(int iterations) {
    char pattern[] = "/tmp/vqm-bench-XXXXXX";
    const char* made = mkdtemp(pattern);
    if (!made) return 1;
    const std::string folder = made;
    int status = 1;
    {
        vqm::SettingsStore settings(folder + "/settings.db");
        vqm::SetSettingString(settings, u"InstallPath", vqm::Utf8ToUtf16(folder + "/").c_str());
        vqm::Link link(settings, vqm::DriverRoots{folder + "/run", folder + "/tty"});
        vqm::Dialogs dialogs;
        vqm::ShellContext context{settings, link, dialogs, folder + "/run"};
        {
            vqm::MessageStore store(settings);
            vqm::StoreGuardCreate(store);
            for (int i = 1; i <= kLocalMessages; ++i) {
                vqm::SmsRecord record{};
                record.index = i;
                std::snprintf(record.status, sizeof record.status, "%s",
                              i % 3 == 0   ? "PDA DRAFT"
                              : i % 3 == 1 ? "PDA PDA"
                                           : "STO SENT");
                std::snprintf(record.number, sizeof record.number, "+30697%07d", i);
                std::snprintf(record.date, sizeof record.date, "%02d:%02d:%02d,%02d/%02d/20%02d",
                              i % 24, i % 60, (i * 7) % 60, 1 + i % 28, 1 + i % 12, i % 30);
                const int length = std::snprintf(
                    record.text, sizeof record.text,
                    "Message %d kept on the handheld, with the text a person would write", i);
                record.length = length;
                vqm::StoreAppend(store, vqm::kFolderLocal, record);
            }
        }
        vqm::SmsFolderView view(nullptr, context);
        std::vector<double> times;
        for (int i = 0; i < iterations; ++i) {
            const auto start = Clock::now();
            view.Reload();
            times.push_back(Ms(start));
        }
        int listed = 0;
        for (int page = 0; page < vqm::kPageCount; ++page)
            listed += static_cast<int>(view.Rows(page).size());
        const double median = vqm::bench::Median(times);
        std::printf("%-28s %10s %10s %10s\n", "listing", "messages", "median ms", "worst ms");
        std::printf("%-28s %10d %10.1f %10.1f\n", "handheld folder into view", listed, median,
                    *std::max_element(times.begin(), times.end()));
        status = listed == kLocalMessages && median < 100 ? 0 : 1;
    }
    std::error_code ignored;
    std::filesystem::remove_all(folder, ignored);
    return status;
}

}  // namespace

int main(int argc, char** argv) {
    int iterations = 3, baud = 19200;
    bool refresh = true;
    for (int i = 1; i < argc; ++i) {
        if (!std::strcmp(argv[i], "--iterations") && i + 1 < argc) {
            iterations = std::max(1, std::atoi(argv[++i]));
        } else if (!std::strcmp(argv[i], "--baud") && i + 1 < argc) {
            baud = std::max(300, std::atoi(argv[++i]));
        } else if (!std::strcmp(argv[i], "--listing-only")) {
            refresh = false;
        } else {
            std::printf(
                "Usage: vqm-messaging-bench [--iterations N] [--baud N] [--listing-only]\n"
                "Refreshes a full 50-message SIM from the simulated card and reports the median\n"
                "as a ratio to the line's floor (target <= 1.10); lists a 1,000-message handheld\n"
                "folder into the SMS Folder view (target < 100 ms).\n");
            return std::strcmp(argv[i], "--help") ? 2 : 0;
        }
    }
    if (qEnvironmentVariableIsEmpty("QT_QPA_PLATFORM")) qputenv("QT_QPA_PLATFORM", "offscreen");
    QApplication app(argc, argv);
    const int listing = ListingFigure(std::max(iterations, 10));
    const int refreshed = refresh ? RefreshFigure(baud, iterations) : 0;
    return listing || refreshed ? 1 : 0;
}
