// vqm-link-bench: typical card transactions against the simulated card at the card's line
// rate, each compared with the floor that the link's own rules impose: every byte on the line
// (command, echo, reply) at 10 bits a byte, one 100 ms wait for the first reply byte, and the
// 200 ms of silence that ends a reply. A ratio near 1.00 means the link adds nothing of its
// own; the target is at most 1.05.
#include <algorithm>
#include <chrono>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <string>
#include <vector>

#include "bench/bench_card.h"

namespace {

struct Transaction {
    const char* name;
    std::string command;
};

}  // namespace

int main(int argc, char** argv) {
    int iterations = 15, baud = 19200;
    for (int i = 1; i < argc; ++i) {
        if (!std::strcmp(argv[i], "--iterations") && i + 1 < argc) {
            iterations = std::max(1, std::atoi(argv[++i]));
        } else if (!std::strcmp(argv[i], "--baud") && i + 1 < argc) {
            baud = std::max(300, std::atoi(argv[++i]));
        } else {
            std::printf(
                "Usage: vqm-link-bench [--iterations N] [--baud N]\n"
                "Times AT+CSQ, AT+CLCC with one call and a 200-byte reply against the simulated\n"
                "card and reports each median as a ratio to the line's floor (target <= 1.05).\n");
            return std::strcmp(argv[i], "--help") ? 2 : 0;
        }
    }
    vqm::bench::BenchCard bench(
        baud, [](vqm::cardsim::SimConfig& config) { config.engine.dialDelayMs = 0; });
    vqm::Link& link = bench.GetLink();
    int status = 1;
    if (bench.Up()) {
        char reply[1024];
        // One call in progress, so that AT+CLCC lists it.
        vqm::AtCommand(link, "ATD0123456789;\r", reply, sizeof reply);
        const std::vector<Transaction> transactions = {
            {"AT+CSQ", "AT+CSQ\r"},
            {"AT+CLCC, one call", "AT+CLCC\r"},
            // Identity, signal, network and volume in one line: a 200-byte reply.
            {"200-byte reply",
             "AT+CGMI;+CGMM;+CGMI;+CGMM;+CGMR;+CGSN;+CGSN;+CSQ;+COPS?;+CLVL?;+CLVL?\r"},
        };
        std::printf("%-20s %6s %6s %10s %10s %10s %7s\n", "transaction", "sent", "reply",
                    "floor ms", "median ms", "worst ms", "ratio");
        status = 0;
        for (const Transaction& t : transactions) {
            std::vector<double> times;
            unsigned length = 0;
            for (int i = 0; i < iterations; ++i) {
                const auto start = std::chrono::steady_clock::now();
                length = vqm::AtCommand(link, t.command.c_str(), reply, sizeof reply);
                times.push_back(std::chrono::duration<double, std::milli>(
                                    std::chrono::steady_clock::now() - start)
                                    .count());
            }
            // The command goes out, comes back as its echo, and the reply follows.
            const double bytes = 2.0 * t.command.size() + length;
            const double floorMs = vqm::bench::LineFloorMs(bytes, baud);
            const double median = vqm::bench::Median(times);
            const double ratio = median / floorMs;
            std::printf("%-20s %6zu %6u %10.1f %10.1f %10.1f %7.3f\n", t.name, t.command.size(),
                        length, floorMs, median, *std::max_element(times.begin(), times.end()),
                        ratio);
            if (length == 0 || ratio > 1.05) status = 1;
        }
        vqm::AtCommand(link, "ATH\r", reply, sizeof reply);
    } else {
        std::fprintf(stderr, "vqm-link-bench: the simulated card did not come up\n");
    }
    return status;
}
