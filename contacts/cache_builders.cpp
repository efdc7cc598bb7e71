#include "contacts/cache_builders.h"

#include <chrono>
#include <cstring>
#include <thread>

#include "contacts/phonebook_at.h"
#include "support/numbers.h"
#include "support/text.h"

namespace vqm {

namespace {

constexpr int kRun = 10;
constexpr int kPauseMs = 500;

void Pause(PhonebookCaches& caches, int ms) {
    if (caches.pause)
        caches.pause(ms);
    else
        std::this_thread::sleep_for(std::chrono::milliseconds(ms));
}

void Notify(const CacheNotify& notify, unsigned msg) {
    if (notify) notify(msg);
}

// Appends one record to file n of the group, which the caller holds in the write state: the
// file is opened for that record and closed again, as the builders always did.
void AppendRecord(CacheGroup& group, int fileNumber, const void* record, size_t size) {
    FILE* file = std::fopen(CachePath(group, fileNumber).c_str(), "ab");
    if (!file) return;
    std::fwrite(record, 1, size, file);
    std::fclose(file);
}

// One number of a contact: dialable characters only, then the card's 8-bit text in its 32 bytes.
int NumberField(const std::u16string& number, char (&field)[kOutlookNumberSize]) {
    char16_t digits[256];
    CopyNumberText(number.c_str(), digits, 256);
    return WideToNarrow(digits, field, static_cast<int>(WideLength(digits, 256)), sizeof field);
}

}  // namespace

OutlookRecords MakeOutlookRecords(const AddressBookContact& contact) {
    OutlookRecords r;
    std::memset(&r, 0, sizeof r);
    WideToNarrowBounded(contact.fileAs.c_str(), r.mobile.name, kOutlookNameSize);
    std::memcpy(r.home.name, r.mobile.name, kOutlookNameSize);
    std::memcpy(r.work.name, r.mobile.name, kOutlookNameSize);
    r.mobileLength = NumberField(contact.mobile, r.mobile.number);
    const std::u16string* home[3] = {&contact.home, &contact.home2, &contact.homeFax};
    const std::u16string* work[3] = {&contact.business, &contact.business2, &contact.businessFax};
    for (int i = 0; i < 3; ++i) {
        r.homeLengths[i] = NumberField(*home[i], r.home.numbers[i]);
        r.workLengths[i] = NumberField(*work[i], r.work.numbers[i]);
    }
    return r;
}

void SimCacheBuild(PhonebookCaches& caches, Link& link, const CacheNotify& notify) {
    CacheGroup& group = caches.sim;
    if (!CacheAcquire(group.lock, kCacheWrite)) {
        Notify(notify, kSimCacheDone);
        return;
    }
    // A build always starts from nothing: stray bytes of a damaged file, or records of an
    // earlier run, would put every record behind them out of step.
    CacheDeleteFiles(group);
    const int storages[2] = {kStorageSimCard, kStorageCardPhone};
    bool stop = false;
    for (int file = 1; file <= 2 && !stop; ++file) {
        if (PhonebookSelect(link, storages[file - 1]) != 0) break;
        int32_t used = 0, total = 0;
        PhonebookGetUsage(link, &used, &total);
        int count = 0;
        for (int first = 1, last = std::min(total, kRun); first <= total;
             first = last + 1, last = std::min(last + kRun, total)) {
            PhonebookEntry run[kRun];
            std::memset(run, 0, sizeof run);
            if (!PhonebookReadRange(link, first, last, run)) {
                // No reply at all: the card is gone, and every later run would only time out.
                stop = true;
                break;
            }
            FILE* out = std::fopen(CachePath(group, file).c_str(), "ab");
            if (out) {
                for (const PhonebookEntry& entry : run) {
                    if (entry.numberLength <= 0) continue;
                    std::fwrite(&entry, 1, sizeof entry, out);
                    ++count;
                }
                std::fclose(out);
            }
            if (count == used) break;
        }
        if (!stop) Pause(caches, kPauseMs);
    }
    CacheRelease(group.lock);
    Notify(notify, kSimCacheDone);
}

namespace {

// The builder on a thread of its own, counted as building from now until it lets the group go.
void StartSimBuilder(PhonebookCaches& caches, Link& link, CacheNotify notify) {
    ++caches.simBuilds;
    caches.workers.Start([&caches, &link, notify = std::move(notify)] {
        SimCacheBuild(caches, link, [&caches, &notify](unsigned msg) {
            --caches.simBuilds;  // before the report, so whoever it reaches sees the build over
            Notify(notify, msg);
        });
    });
}

}  // namespace

void SimCacheLoad(PhonebookCaches& caches, Link& link, CacheNotify notify) {
    if (CachePresent(caches.sim)) {
        caches.workers.Start([&caches, notify = std::move(notify)] {
            Pause(caches, kPauseMs);
            Notify(notify, kSimCacheDone);
        });
        return;
    }
    StartSimBuilder(caches, link, std::move(notify));
}

void SimCacheRebuild(PhonebookCaches& caches, Link& link, CacheNotify notify) {
    // Whether present or not: a damaged file is no cache, but left alone it would stay for good.
    CacheDeleteFiles(caches.sim);
    StartSimBuilder(caches, link, std::move(notify));
}

bool SimCacheBuilding(const PhonebookCaches& caches) {
    return caches.simBuilds.load() > 0;
}

void OutlookCacheBuild(PhonebookCaches& caches, const AddressBookReader& read,
                       const CacheErrorBox& box, const CacheNotify& notify) {
    const AddressBookResult book = read ? read() : AddressBookResult{};
    if (!book.opened) {
        if (!book.missingLibrary.empty() && box)
            box(Utf8ToUtf16(book.missingLibrary) + u" is missing.");
        Notify(notify, kOutlookCacheDone);
        return;
    }
    CacheGroup& group = caches.outlook;
    if (book.contacts.empty() || !CacheAcquire(group.lock, kCacheWrite)) {
        Notify(notify, kOutlookCacheDone);
        return;
    }
    for (const AddressBookContact& contact : book.contacts) {
        const OutlookRecords r = MakeOutlookRecords(contact);
        if (r.mobileLength > 0) AppendRecord(group, 1, &r.mobile, sizeof r.mobile);
        if (r.homeLengths[0] > 0 || r.homeLengths[1] > 0 || r.homeLengths[2] > 0)
            AppendRecord(group, 2, &r.home, sizeof r.home);
        if (r.workLengths[0] > 0 || r.workLengths[1] > 0 || r.workLengths[2] > 0)
            AppendRecord(group, 3, &r.work, sizeof r.work);
    }
    CacheRelease(group.lock);
    Notify(notify, kOutlookCacheDone);
}

void OutlookCacheClear(PhonebookCaches& caches, CacheNotify notify) {
    // Damaged files go too: as the SIM's, they would otherwise stay for good.
    CacheDeleteFiles(caches.outlook);
    caches.workers.Start([&caches, notify = std::move(notify)] {
        Pause(caches, kPauseMs);
        Notify(notify, kOutlookCacheDone);
    });
}

void OutlookCacheRebuild(PhonebookCaches& caches, AddressBookReader read, CacheErrorBox box,
                         CacheNotify notify) {
    CacheDeleteFiles(caches.outlook);
    caches.workers.Start(
        [&caches, read = std::move(read), box = std::move(box), notify = std::move(notify)] {
            OutlookCacheBuild(caches, read, box, notify);
        });
}

}  // namespace vqm
