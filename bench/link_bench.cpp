// vqm-link-bench: typical card transactions against the simulated card at the card's line
// rate, each compared with the floor that the link's own rules impose: every byte on the line
// (command, its echo where the modem echoes, reply) at 10 bits a byte, one 100 ms wait for the
// first reply byte, and the 200 ms of silence that ends a reply. A ratio near 1.00 means the
// link adds nothing of its own. Both personalities of the simulated card are timed: the card's
// own dialect (it echoes; target at most 1.05) and a standard modem (no echo, unsolicited lines
// at any moment; target at most 1.10).
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

struct Personality {
    const char* name;
    vqm::cardsim::Dialect dialect;
    bool echoes;
    double target;
};

// 0 when every median met its target, 1 otherwise or when the card did not come up.
int Run(const Personality& who, int iterations, int baud) {
    vqm::bench::BenchCard bench(baud, [&](vqm::cardsim::SimConfig& config) {
        config.engine.dialDelayMs = 0;
        config.engine.dialect = who.dialect;
    });
    if (!bench.Up()) {
        std::fprintf(stderr, "vqm-link-bench: the simulated card (%s) did not come up\n",
                     who.name);
        return 1;
    }
    vqm::Link& link = bench.GetLink();
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
    std::printf("%s (%s, target <= %.2f)\n", who.name,
                who.echoes ? "echoes" : "no echo", who.target);
    std::printf("  %-20s %6s %6s %10s %10s %10s %7s\n", "transaction", "sent", "reply",
                "floor ms", "median ms", "worst ms", "ratio");
    int status = 0;
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
        // The command goes out, comes back as its echo where the modem echoes, and the reply
        // follows (the reply as returned holds neither echo nor unsolicited lines).
        const double bytes = (who.echoes ? 2.0 : 1.0) * t.command.size() + length;
        const double floorMs = vqm::bench::LineFloorMs(bytes, baud);
        const double median = vqm::bench::Median(times);
        const double ratio = median / floorMs;
        std::printf("  %-20s %6zu %6u %10.1f %10.1f %10.1f %7.3f%s\n", t.name, t.command.size(),
                    length, floorMs, median, *std::max_element(times.begin(), times.end()), ratio,
                    length == 0 || ratio > who.target ? "  MISSED" : "");
        if (length == 0 || ratio > who.target) status = 1;
    }
    vqm::AtCommand(link, "ATH\r", reply, sizeof reply);
    return status;
}

}  // namespace

int main(int argc, char** argv) {
    int iterations = 15, baud = 19200;
    std::string dialect = "both";
    for (int i = 1; i < argc; ++i) {
        if (!std::strcmp(argv[i], "--iterations") && i + 1 < argc) {
            iterations = std::max(1, std::atoi(argv[++i]));
        } else if (!std::strcmp(argv[i], "--baud") && i + 1 < argc) {
            baud = std::max(300, std::atoi(argv[++i]));
        } else if (!std::strcmp(argv[i], "--dialect") && i + 1 < argc &&
                   (!std::strcmp(argv[i + 1], "card") || !std::strcmp(argv[i + 1], "standard") ||
                    !std::strcmp(argv[i + 1], "both"))) {
            dialect = argv[++i];
        } else {
            std::printf(
                "Usage: vqm-link-bench [--iterations N] [--baud N] [--dialect card|standard|both]\n"
                "Times AT+CSQ, AT+CLCC with one call and a 200-byte reply against the simulated\n"
                "card and reports each median as a ratio to the line's floor (target <= 1.05 on\n"
                "the card's dialect, <= 1.10 on a standard modem). Both dialects by default.\n");
            return std::strcmp(argv[i], "--help") ? 2 : 0;
        }
    }
    const Personality card{"card's dialect", vqm::cardsim::Dialect::Card, true, 1.05};
    const Personality standard{"standard modem", vqm::cardsim::Dialect::Standard, false, 1.10};
    int status = 0;
    if (dialect != "standard") status |= Run(card, iterations, baud);
    if (dialect != "card") status |= Run(standard, iterations, baud);
    return status;
}
