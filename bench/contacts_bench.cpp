// vqm-contacts-bench: two figures of the contacts subsystem.
// 1. The SIM cache builder over a full 250-entry SIM (and an empty card memory) on the simulated
//    card at 19200 baud, against its floor: the same exchanges' bytes on the line at 10 bits a
//    byte, the 100 ms wait for a reply's first byte and the 200 ms of silence that ends it, plus
//    the builder's own two 500 ms pauses between storages. Target ratio: at most 1.10.
// 2. A name looked up by number over 10,000 cached address-book contacts: the last one in the
//    file, and a number that is in none of the files (every record read). Target: under 1 ms.
#include <algorithm>
#include <chrono>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <filesystem>
#include <string>
#include <vector>

#include "bench/bench_card.h"
#include "contacts/cache_builders.h"
#include "contacts/phonebook_at.h"

namespace {

constexpr int kEntries = 250;
constexpr int kContacts = 10000;
using Clock = std::chrono::steady_clock;

double Ms(Clock::time_point start) {
    return std::chrono::duration<double, std::milli>(Clock::now() - start).count();
}

// The builder's exchanges for a full SIM and an empty card memory, as the wrappers send them.
std::vector<std::string> BuildCommands() {
    std::vector<std::string> commands = {"AT+CPBS=\"SM\"\r", "AT+CPBS?\r"};
    for (int first = 1; first <= kEntries; first += 10)
        commands.push_back("AT+CPBR=" + std::to_string(first) + "," +
                           std::to_string(std::min(first + 9, kEntries)) + "\r");
    commands.push_back("AT+CPBS=\"ME\"\r");
    commands.push_back("AT+CPBS?\r");
    commands.push_back("AT+CPBR=1,10\r");
    return commands;
}

int CacheBuildFigure(int iterations, int baud) {
    vqm::bench::BenchCard bench(baud, {}, [](vqm::cardsim::CardSim& card) {
        return card.Control("phonebook-fill SM " + std::to_string(kEntries)) == "OK" &&
               card.Control("phonebook-clear ME") == "OK";
    });
    if (!bench.Up()) {
        std::fprintf(stderr, "vqm-contacts-bench: the simulated card did not come up\n");
        return 1;
    }
    vqm::Link& link = bench.GetLink();
    const std::u16string folder(bench.Folder().begin(), bench.Folder().end());
    vqm::SetSettingString(bench.Settings(), u"InstallPath", (folder + u"/").c_str());
    double floorMs = 2 * 500;  // the builder's pauses between storages
    size_t bytes = 0;
    const std::vector<std::string> commands = BuildCommands();
    for (const std::string& command : commands) {
        char reply[vqm::kPhonebookRangeReplySize];
        const unsigned length = vqm::AtCommand(link, command.c_str(), reply, sizeof reply);
        bytes += 2 * command.size() + length;
        floorMs += vqm::bench::LineFloorMs(static_cast<double>(2 * command.size() + length), baud);
    }
    vqm::PhonebookCaches caches(bench.Settings());
    std::vector<double> times;
    size_t records = 0;
    for (int i = 0; i < iterations; ++i) {
        vqm::CacheDeleteFiles(caches.sim);
        const auto start = Clock::now();
        vqm::SimCacheBuild(caches, link, {});
        times.push_back(Ms(start));
        std::error_code error;
        records = std::filesystem::file_size(vqm::CachePath(caches.sim, 1), error) /
                  vqm::kPhonebookEntrySize;
    }
    const double median = vqm::bench::Median(times);
    const double ratio = median / floorMs;
    std::printf("%-30s %9s %7s %10s %10s %7s\n", "SIM cache build", "exchanges", "bytes",
                "floor ms", "median ms", "ratio");
    std::printf("%-30s %9zu %7zu %10.1f %10.1f %7.3f\n", "250 SIM + empty card, 19200 Bd",
                commands.size(), bytes, floorMs, median, ratio);
    std::printf("records cached: %zu of %d\n", records, kEntries);
    return records == kEntries && ratio <= 1.10 ? 0 : 1;
}

int LookUpFigure(int iterations) {
    char folderName[] = "/tmp/vqm-bench-XXXXXX";
    if (!mkdtemp(folderName)) return 1;
    const std::string folder = folderName;
    int status = 1;
    {
        vqm::SettingsStore settings(folder + "/settings.db");
        const std::u16string wide(folder.begin(), folder.end());
        vqm::SetSettingString(settings, u"InstallPath", (wide + u"/").c_str());
        vqm::PhonebookCaches caches(settings);
        vqm::AddressBookResult book;
        book.opened = true;
        for (int i = 0; i < kContacts; ++i) {
            vqm::AddressBookContact contact;
            const std::string n = std::to_string(i);
            contact.fileAs = u"Contact " + std::u16string(n.begin(), n.end());
            const std::string number = "+4917" + std::to_string(1000000 + i);
            contact.mobile = std::u16string(number.begin(), number.end());
            contact.home = u"030" + std::u16string(n.begin(), n.end());
            book.contacts.push_back(contact);
        }
        vqm::OutlookCacheBuild(caches, [&] { return book; }, {}, {});
        const std::string last = "+4917" + std::to_string(1000000 + kContacts - 1);
        std::vector<double> found, missing;
        bool ok = true;
        for (int i = 0; i < iterations; ++i) {
            char16_t name[140];
            auto start = Clock::now();
            ok = vqm::FindNameByNumber(caches, last.c_str(), name, 140) && ok;
            found.push_back(Ms(start));
            start = Clock::now();
            ok = !vqm::FindNameByNumber(caches, "+1555000000", name, 140) && ok;
            missing.push_back(Ms(start));
        }
        const double foundMs = vqm::bench::Median(found), missingMs = vqm::bench::Median(missing);
        std::printf("%-30s %10s\n", "name look-up, 10,000 contacts", "median ms");
        std::printf("%-30s %10.3f\n", "last mobile number", foundMs);
        std::printf("%-30s %10.3f\n", "number in no file", missingMs);
        status = ok && foundMs < 1.0 && missingMs < 1.0 ? 0 : 1;
    }
    std::error_code ignored;
    std::filesystem::remove_all(folder, ignored);
    return status;
}

}  // namespace

int main(int argc, char** argv) {
    int iterations = 3, baud = 19200;
    std::string only;
    for (int i = 1; i < argc; ++i) {
        if (!std::strcmp(argv[i], "--only") && i + 1 < argc) {
            only = argv[++i];
        } else if (!std::strcmp(argv[i], "--iterations") && i + 1 < argc) {
            iterations = std::max(1, std::atoi(argv[++i]));
        } else if (!std::strcmp(argv[i], "--baud") && i + 1 < argc) {
            baud = std::max(300, std::atoi(argv[++i]));
        } else {
            std::printf(
                "Usage: vqm-contacts-bench [--iterations N] [--baud N] [--only build|lookup]\n"
                "Times the SIM cache build over a full 250-entry SIM against the line's floor\n"
                "(target <= 1.10) and a name look-up over 10,000 cached contacts (< 1 ms).\n");
            return std::strcmp(argv[i], "--help") ? 2 : 0;
        }
    }
    const int build = only == "lookup" ? 0 : CacheBuildFigure(iterations, baud);
    const int lookUp = only == "build" ? 0 : LookUpFigure(std::max(iterations, 20));
    return build | lookUp;
}
