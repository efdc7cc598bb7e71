#include "contacts/phonebook_cache.h"

#include <chrono>
#include <cstring>
#include <filesystem>
#include <thread>
#include <vector>

#include "support/files.h"
#include "support/lock_within.h"
#include "support/numbers.h"
#include "support/settings_store.h"
#include "support/text.h"

namespace vqm {

namespace {

constexpr const char* kSimFiles[] = {"simphonebk1.db", "simphonebk2.db"};
constexpr const char* kOutlookFiles[] = {"phonebk1.db", "phonebk2.db", "phonebk3.db"};

bool ValidFile(const CacheGroup& group, int fileNumber) {
    return fileNumber >= 1 && fileNumber <= CacheFileCount(group);
}

// Reads file n of the group under the read state, calling visit with each whole record until it
// returns true. True when visit accepted one. Records come in blocks: a look-up scans ten
// thousand address-book contacts while a call rings, and one read a record costs more than the
// comparisons.
template <typename Visit>
bool ScanFile(CacheGroup& group, int fileNumber, Visit visit) {
    constexpr size_t kBlockRecords = 256;
    const size_t size = CacheRecordSize(group, fileNumber);
    static thread_local std::vector<unsigned char> block;
    block.resize(kBlockRecords * kOutlookNumbersRecordSize);
    FILE* stream = CacheOpen(group, fileNumber, kCacheRead);
    bool found = false;
    if (stream) {
        size_t got;
        while (!found && (got = std::fread(block.data(), size, kBlockRecords, stream)) > 0) {
            for (size_t i = 0; i < got && !found; ++i)
                found = visit(block.data() + i * size);
        }
    }
    CacheClose(group, stream);
    return found;
}

// Length of a zero-terminated field of the file, never past its width.
int FieldLength(const char* field, size_t width) {
    return static_cast<int>(strnlen(field, width));
}

}  // namespace

int CacheFileCount(const CacheGroup& group) {
    return group.id == CacheGroupId::Sim ? 2 : 3;
}

size_t CacheRecordSize(const CacheGroup& group, int fileNumber) {
    if (!ValidFile(group, fileNumber)) return 0;
    if (group.id == CacheGroupId::Sim) return kPhonebookEntrySize;
    return fileNumber == 1 ? kOutlookMobileRecordSize : kOutlookNumbersRecordSize;
}

std::string CachePath(CacheGroup& group, int fileNumber) {
    if (!ValidFile(group, fileNumber)) return {};
    const char* name =
        group.id == CacheGroupId::Sim ? kSimFiles[fileNumber - 1] : kOutlookFiles[fileNumber - 1];
    char16_t folder[kMaxSettingLength + 2];
    if (!GetInstallPath(group.settings, folder, sizeof folder / sizeof folder[0])) return name;
    return Utf16ToUtf8(folder) + name;
}

void CacheLockCreate(CacheLock& lock) {
    lock.state = kCacheFree;
}

int CacheAcquire(CacheLock& lock, int mode) {
    if (!LockWithin(lock.mutex, lock.waitMs)) return 0;
    int result = 0;
    const int state = lock.state.load();
    if (mode == kCacheRead && state != kCacheWriting) {
        lock.state = kCacheReading;
        result = 1;
    } else if (mode == kCacheWrite && state == kCacheFree) {
        lock.state = kCacheWriting;
        result = 1;
    }
    lock.mutex.unlock();
    return result;
}

void CacheRelease(CacheLock& lock) {
    const bool held = LockWithin(lock.mutex, lock.waitMs);
    lock.state = kCacheFree;
    if (held) lock.mutex.unlock();
}

void CacheLockDestroy(CacheLock& lock) {
    // A builder still running owns the write state; wait for it to give the group up.
    while (!CacheAcquire(lock, kCacheWrite))
        std::this_thread::sleep_for(std::chrono::milliseconds(10));
    CacheRelease(lock);
}

FILE* CacheOpen(CacheGroup& group, int fileNumber, int mode) {
    if (!ValidFile(group, fileNumber) || (mode != kCacheRead && mode != kCacheWrite))
        return nullptr;
    if (!CacheAcquire(group.lock, mode)) return nullptr;
    const std::string path = CachePath(group, fileNumber);
    if (mode == kCacheWrite) DropPartialTail(path, CacheRecordSize(group, fileNumber));
    // By the mode granted, not the word: another reader's close may already have cleared it,
    // and a reader must never create a file.
    return std::fopen(path.c_str(), mode == kCacheRead ? "rb" : "ab");
}

void CacheClose(CacheGroup& group, FILE* stream) {
    if (stream) std::fclose(stream);
    CacheRelease(group.lock);
}

bool CachePresent(CacheGroup& group) {
    for (int n = 1; n <= CacheFileCount(group); ++n) {
        std::error_code error;
        const auto size = std::filesystem::file_size(CachePath(group, n), error);
        // The remainder is what counts, so an empty file is a cache with no entries.
        if (!error && size % CacheRecordSize(group, n) == 0) return true;
    }
    return false;
}

int SimCacheFindName(CacheGroup& group, const char* number, char16_t* name, size_t nameSize) {
    if (!number || number[0] == '\0' || !name || nameSize == 0) return 0;
    if (!CachePresent(group)) return 0;
    const int length = FieldLength(number, kPhonebookNumberSize);
    for (int n = 1; n <= CacheFileCount(group); ++n) {
        const bool found = ScanFile(group, n, [&](const unsigned char* bytes) {
            PhonebookEntry entry;
            std::memcpy(&entry, bytes, sizeof entry);
            if (entry.numberLength != length || !NumbersMatch(entry.number, number, length))
                return false;
            // The lengths come from a file: keep them inside the fields.
            int textLength = entry.textLength;
            if (textLength < 0) textLength = 0;
            if (textLength > kPhonebookTextSize) textLength = kPhonebookTextSize;
            NarrowToWide(entry.text, name, textLength, nameSize);
            return true;
        });
        if (found) return 1;
    }
    return 0;
}

int OutlookCacheFindName(CacheGroup& group, const char* number, char16_t* name, size_t nameSize) {
    if (!number || number[0] == '\0' || !name || nameSize == 0) return 0;
    if (!CachePresent(group)) return 0;
    const int length = FieldLength(number, kOutlookNumberSize);
    for (int n = 1; n <= CacheFileCount(group); ++n) {
        const bool found = ScanFile(group, n, [&](const unsigned char* bytes) {
            // The mobile record's number and the first of the three numbers share offset 128,
            // and only that one is looked up by.
            const char* recordName = reinterpret_cast<const char*>(bytes);
            const char* recordNumber = recordName + kOutlookNameSize;
            if (FieldLength(recordNumber, kOutlookNumberSize) != length ||
                !NumbersMatch(recordNumber, number, length))
                return false;
            NarrowToWideZ(recordName, kOutlookNameSize, name, nameSize);
            return true;
        });
        if (found) return 1;
    }
    return 0;
}

void CacheWorkers::ReapFinished() {
    for (auto it = workers_.begin(); it != workers_.end();) {
        if (it->done->load()) {
            it->thread.join();
            it = workers_.erase(it);
        } else {
            ++it;
        }
    }
}

void CacheWorkers::Start(std::function<void()> body) {
    auto done = std::make_shared<std::atomic<bool>>(false);
    std::lock_guard<std::mutex> lock(mutex_);
    ReapFinished();
    workers_.push_back(Worker{std::thread([body = std::move(body), done] {
                                  body();
                                  done->store(true);
                              }),
                              done});
}

bool CacheWorkers::Busy() {
    std::lock_guard<std::mutex> lock(mutex_);
    for (const Worker& worker : workers_)
        if (!worker.done->load()) return true;
    return false;
}

void CacheWorkers::JoinAll(const std::function<void(const std::function<bool()>&)>& wait) {
    if (wait) wait([this] { return !Busy(); });
    std::list<Worker> all;
    {
        std::lock_guard<std::mutex> lock(mutex_);
        all.swap(workers_);
    }
    for (Worker& worker : all)
        worker.thread.join();
}

namespace {

// Copies file n to "<path>.tmp" record by record, writing what change gives for each record
// (nothing when it returns false), flushes the copy to disk and renames it over the file, so
// that a crash leaves the old file or the new one. A copy left empty removes the file when
// dropEmpty. Runs under the write state.
template <typename Change>
int RewriteSimFile(CacheGroup& group, int fileNumber, bool dropEmpty, Change change) {
    if (!ValidFile(group, fileNumber) || group.id != CacheGroupId::Sim) return 0;
    if (!CacheAcquire(group.lock, kCacheWrite)) return 0;
    const std::string path = CachePath(group, fileNumber);
    const std::string tmpPath = path + ".tmp";
    int result = 0;
    FILE* in = std::fopen(path.c_str(), "rb");
    FILE* out = in ? std::fopen(tmpPath.c_str(), "wb") : nullptr;
    if (in && out) {
        PhonebookEntry record;
        bool ok = true;
        long written = 0;
        while (ok && std::fread(&record, 1, sizeof record, in) == sizeof record) {
            if (!change(record)) continue;
            ok = std::fwrite(&record, 1, sizeof record, out) == sizeof record;
            ++written;
        }
        std::fclose(in);
        in = nullptr;
        ok = FlushToDisk(out) && ok;
        ok = std::fclose(out) == 0 && ok;
        out = nullptr;
        if (ok && dropEmpty && written == 0) {
            std::remove(path.c_str());
            std::remove(tmpPath.c_str());
            result = 1;
        } else if (ok && std::rename(tmpPath.c_str(), path.c_str()) == 0) {
            result = 1;
        }
    }
    if (in) std::fclose(in);
    if (out) std::fclose(out);
    if (!result) std::remove(tmpPath.c_str());
    CacheRelease(group.lock);
    return result;
}

}  // namespace

int SimCacheNextFreeIndex(CacheGroup& group, int fileNumber) {
    constexpr int kIndexLimit = 512;
    bool used[kIndexLimit] = {};
    ScanFile(group, fileNumber, [&](const unsigned char* bytes) {
        int32_t index;
        std::memcpy(&index, bytes, sizeof index);
        if (index >= 0 && index < kIndexLimit) used[index] = true;
        return false;
    });
    for (int index = 1; index < kIndexLimit; ++index)
        if (!used[index]) return index;
    return 0;
}

int SimCacheAppend(CacheGroup& group, int fileNumber, const PhonebookEntry& entry) {
    if (group.id != CacheGroupId::Sim) return 0;
    FILE* stream = CacheOpen(group, fileNumber, kCacheWrite);
    const bool opened = stream != nullptr;
    if (stream) std::fwrite(&entry, 1, sizeof entry, stream);
    CacheClose(group, stream);
    return opened ? 1 : 0;
}

int SimCacheReplace(CacheGroup& group, int fileNumber, const PhonebookEntry& entry) {
    return RewriteSimFile(group, fileNumber, false, [&](PhonebookEntry& record) {
        if (record.index == entry.index) record = entry;
        return true;
    });
}

int SimCacheRemove(CacheGroup& group, int fileNumber, int index) {
    if (index < 1) return 0;
    return RewriteSimFile(group, fileNumber, true,
                          [&](const PhonebookEntry& record) { return record.index != index; });
}

void CacheDeleteFiles(CacheGroup& group) {
    for (int n = 1; n <= CacheFileCount(group); ++n)
        std::remove(CachePath(group, n).c_str());
}

int FindNameByNumber(PhonebookCaches& caches, const char* number, char16_t* name, size_t nameSize) {
    return SimCacheFindName(caches.sim, number, name, nameSize) ||
                   OutlookCacheFindName(caches.outlook, number, name, nameSize)
               ? 1
               : 0;
}

}  // namespace vqm
