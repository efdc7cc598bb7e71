// vqm-phonebook-bench: reads a full 250-entry SIM phonebook from the simulated card the way the
// cache builder does (select, usage, then runs of ten with AT+CPBR=a,b) and compares the time
// with the floor of the link's own rules for the same exchanges: every byte on the line
// (command, echo, reply) at 10 bits a byte, plus per exchange the 100 ms wait for the first
// reply byte and the 200 ms of silence that ends the reply. Target ratio: at most 1.05.
#include <algorithm>
#include <chrono>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <string>
#include <vector>

#include "bench/bench_card.h"
#include "contacts/phonebook_at.h"

namespace {

constexpr int kEntries = 250;

using Clock = std::chrono::steady_clock;

// The commands of one full read, in order, as the wrappers format them.
std::vector<std::string> ReadCommands() {
    std::vector<std::string> commands = {"AT+CPBS=\"SM\"\r", "AT+CPBS?\r"};
    for (int first = 1; first <= kEntries; first += 10)
        commands.push_back("AT+CPBR=" + std::to_string(first) + "," +
                           std::to_string(std::min(first + 9, kEntries)) + "\r");
    return commands;
}

// One full read through the wrappers; the number of entries found.
int ReadPhonebook(vqm::Link& link) {
    if (vqm::PhonebookSelect(link, vqm::kStorageSimCard) != 0) return 0;
    int32_t used = 0, total = 0;
    if (!vqm::PhonebookGetUsage(link, &used, &total)) return 0;
    int found = 0;
    for (int first = 1; first <= total; first += 10) {
        const int last = std::min(first + 9, static_cast<int>(total));
        vqm::PhonebookEntry slots[10] = {};
        if (!vqm::PhonebookReadRange(link, first, last, slots)) return 0;
        for (const vqm::PhonebookEntry& e : slots)
            found += e.numberLength > 0;
    }
    return found;
}

}  // namespace

int main(int argc, char** argv) {
    int iterations = 5, baud = 19200;
    for (int i = 1; i < argc; ++i) {
        if (!std::strcmp(argv[i], "--iterations") && i + 1 < argc) {
            iterations = std::max(1, std::atoi(argv[++i]));
        } else if (!std::strcmp(argv[i], "--baud") && i + 1 < argc) {
            baud = std::max(300, std::atoi(argv[++i]));
        } else {
            std::printf(
                "Usage: vqm-phonebook-bench [--iterations N] [--baud N]\n"
                "Reads a full 250-entry SIM phonebook from the simulated card in runs of ten and\n"
                "reports the median as a ratio to the line's floor (target <= 1.05).\n");
            return std::strcmp(argv[i], "--help") ? 2 : 0;
        }
    }
    vqm::bench::BenchCard bench(baud, {}, [](vqm::cardsim::CardSim& card) {
        return card.Control("phonebook-fill SM " + std::to_string(kEntries)) == "OK";
    });
    vqm::Link& link = bench.GetLink();
    int status = 1;
    if (bench.Up()) {
        // The bytes of each exchange, taken once with the same commands the wrappers send.
        double floorMs = 0;
        size_t lineBytes = 0;
        const std::vector<std::string> commands = ReadCommands();
        for (const std::string& command : commands) {
            char reply[vqm::kPhonebookRangeReplySize];
            const unsigned length = vqm::AtCommand(link, command.c_str(), reply, sizeof reply);
            const size_t bytes = 2 * command.size() + length;
            lineBytes += bytes;
            floorMs += vqm::bench::LineFloorMs(static_cast<double>(bytes), baud);
        }
        std::vector<double> times;
        int found = 0;
        for (int i = 0; i < iterations; ++i) {
            const auto start = Clock::now();
            found = ReadPhonebook(link);
            times.push_back(
                std::chrono::duration<double, std::milli>(Clock::now() - start).count());
        }
        const double median = vqm::bench::Median(times);
        const double ratio = median / floorMs;
        std::printf("%-28s %9s %7s %10s %10s %10s %7s\n", "transaction", "exchanges", "bytes",
                    "floor ms", "median ms", "worst ms", "ratio");
        std::printf("%-28s %9zu %7zu %10.1f %10.1f %10.1f %7.3f\n", "full SIM phonebook (250)",
                    commands.size(), lineBytes, floorMs, median,
                    *std::max_element(times.begin(), times.end()), ratio);
        std::printf("entries read: %d of %d\n", found, kEntries);
        status = found == kEntries && ratio <= 1.05 ? 0 : 1;
    } else {
        std::fprintf(stderr, "vqm-phonebook-bench: the simulated card did not come up\n");
    }
    return status;
}
