// Local copies of the phonebooks, so that a name can be found by number without the slow
// serial link: the SIM group ("simphonebk1.db" SIM, "simphonebk2.db" Card Phone, records of
// PhonebookEntry) and the Outlook group ("phonebk1.db" mobile, "phonebk2.db" home,
// "phonebk3.db" work). Files are bare arrays of records; each group has one lock whose access
// word lets several readers or one writer (a builder thread) in at a time.
#pragma once

#include <atomic>
#include <bit>
#include <cstddef>
#include <cstdint>
#include <cstdio>
#include <functional>
#include <list>
#include <memory>
#include <mutex>
#include <string>
#include <thread>

#include "contacts/phonebook_entry.h"

namespace vqm {

class SettingsStore;

inline constexpr int kOutlookNameSize = 128;
inline constexpr int kOutlookNumberSize = 32;

// "phonebk1.db": a contact's mobile number.
struct OutlookMobileRecord {
    char name[kOutlookNameSize];      // 8-bit, zero-terminated, zero-padded
    char number[kOutlookNumberSize];  // 8-bit, zero-terminated, zero-padded
};

// "phonebk2.db": home, second home, home fax; "phonebk3.db": business, second business,
// business fax. Only the first number is looked up by.
struct OutlookNumbersRecord {
    char name[kOutlookNameSize];
    char numbers[3][kOutlookNumberSize];
};

inline constexpr size_t kOutlookMobileRecordSize = 160;
inline constexpr size_t kOutlookNumbersRecordSize = 224;
static_assert(sizeof(OutlookMobileRecord) == kOutlookMobileRecordSize);
static_assert(offsetof(OutlookMobileRecord, number) == 128);
static_assert(sizeof(OutlookNumbersRecord) == kOutlookNumbersRecordSize);
static_assert(offsetof(OutlookNumbersRecord, numbers) == 128);

// Access word of a cache lock.
inline constexpr int kCacheFree = 0, kCacheReading = 1, kCacheWriting = 2;
// Modes of CacheAcquire and CacheOpen.
inline constexpr int kCacheRead = 1, kCacheWrite = 2;

// A mutex held only for an instant, and the access word it guards.
struct CacheLock {
    std::mutex mutex;
    // Changed under the mutex; atomic so that a release that could not have the mutex in time
    // still frees the group rather than leave it shut until the program ends.
    std::atomic<int> state{kCacheFree};
    // How long an acquire or release waits for the mutex; tests shorten it.
    int waitMs = 500;
};

enum class CacheGroupId { Sim, Outlook };

// One group of cache files with its lock.
struct CacheGroup {
    CacheGroup(SettingsStore& settings, CacheGroupId id) : settings(settings), id(id) {}

    SettingsStore& settings;  // for the install folder, read at every open
    const CacheGroupId id;
    CacheLock lock;
};

// The builder threads and the short "done" reporters, kept so that each is joined rather than
// left running when the program ends.
class CacheWorkers {
  public:
    CacheWorkers() = default;
    CacheWorkers(const CacheWorkers&) = delete;
    CacheWorkers& operator=(const CacheWorkers&) = delete;
    ~CacheWorkers() { JoinAll(); }

    // Runs body on a thread of its own; threads that have finished are joined first.
    void Start(std::function<void()> body);
    // Waits for every thread and joins it. wait, when given, is how the caller waits (the
    // view's thread keeps delivering the workers' sends meanwhile, so none of them blocks).
    void JoinAll(const std::function<void(const std::function<bool()>& done)>& wait = {});
    // True while some thread has not finished its body.
    bool Busy();

  private:
    struct Worker {
        std::thread thread;
        std::shared_ptr<std::atomic<bool>> done;
    };
    void ReapFinished();  // with mutex_ held

    std::mutex mutex_;
    std::list<Worker> workers_;
};

// Both groups, made once with the main window and shared by every reader and builder.
struct PhonebookCaches {
    explicit PhonebookCaches(SettingsStore& settings)
        : sim(settings, CacheGroupId::Sim), outlook(settings, CacheGroupId::Outlook) {}

    CacheGroup sim;
    CacheGroup outlook;
    // The pauses of the builders and reporters (500 ms between storages, before a "done"
    // without a build); tests shorten them.
    std::function<void(int ms)> pause;
    // SIM builds started and not yet ended (cache_builders.h: SimCacheBuilding).
    std::atomic<int> simBuilds{0};
    // Declared last: threads still running use the groups above, so they are joined first.
    CacheWorkers workers;
};

// Files in the group (2 SIM, 3 Outlook), the record size of file n (1-based), and its path
// (install folder + file name; empty for a bad file number).
int CacheFileCount(const CacheGroup& group);
size_t CacheRecordSize(const CacheGroup& group, int fileNumber);
std::string CachePath(CacheGroup& group, int fileNumber);

// Sets the access word free (when the main window is made).
void CacheLockCreate(CacheLock& lock);
// Mode 1 read: succeeds unless a writer is in, and marks reading. Mode 2 write: succeeds only
// when free, and marks writing. 0 when the mutex was not had within the wait or the state
// refuses. Readers share the reading mark, and the first to release clears it for all.
int CacheAcquire(CacheLock& lock, int mode);
// Sets the access word free, whoever held it.
void CacheRelease(CacheLock& lock);
// Waits until a write acquire succeeds, so no builder is inside, then frees the lock (when
// the main window goes).
void CacheLockDestroy(CacheLock& lock);

// Acquires in mode and opens file n: "rb" for reading, "ab" for writing. Nothing for a bad
// file number or mode, when the lock is refused, or when the file cannot be opened.
FILE* CacheOpen(CacheGroup& group, int fileNumber, int mode);
// Closes the stream when there is one and always releases the lock, even after a refused
// open: callers pair every CacheOpen with one CacheClose.
void CacheClose(CacheGroup& group, FILE* stream);

// True when some file of the group exists and its length is a whole number of records; an
// empty file counts.
bool CachePresent(CacheGroup& group);

// Looks a number up in the SIM group (SIM file first, then Card Phone). A record matches when
// its number has the same length and NumbersMatch accepts it; its name goes to name as UTF-16
// (NUL-terminated within nameSize units). 1 when found; 0 when not, when the group is absent
// or busy, or the number is empty.
int SimCacheFindName(CacheGroup& group, const char* number, char16_t* name, size_t nameSize);
// The same over the mobile, home and work files, comparing only the first number of a home or
// work record.
int OutlookCacheFindName(CacheGroup& group, const char* number, char16_t* name, size_t nameSize);

// The write side of the SIM group (file 1 SIM, 2 Card Phone).

// The smallest index 1..511 that no record of the file uses; 0 when all are taken. A missing or
// empty file gives 1. Indices outside 0..511 in the file are ignored.
int SimCacheNextFreeIndex(CacheGroup& group, int fileNumber);
// Appends the 80 bytes of entry under the write state; 1 when the file opened.
int SimCacheAppend(CacheGroup& group, int fileNumber, const PhonebookEntry& entry);
// Rewrites the file through "<path>.tmp" (flushed to disk before it is renamed over the file),
// with entry in place of every record of its index. 1 when done; 0 when the lock was refused
// or the file could not be opened (the temporary copy is then removed).
int SimCacheReplace(CacheGroup& group, int fileNumber, const PhonebookEntry& entry);
// The same copy without the records of index; a file left empty is deleted. An index below 1
// is refused with 0.
int SimCacheRemove(CacheGroup& group, int fileNumber, int index);
// Deletes every file of the group (the lock is not taken: callers hold the write state or know
// that no builder runs).
void CacheDeleteFiles(CacheGroup& group);

// The look-up the call log, alerts and message lists use: SIM group first, then Outlook.
int FindNameByNumber(PhonebookCaches& caches, const char* number, char16_t* name, size_t nameSize);

}  // namespace vqm
