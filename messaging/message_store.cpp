#include "messaging/message_store.h"

#include <algorithm>
#include <chrono>
#include <cstdlib>
#include <cstring>
#include <ctime>
#include <filesystem>

#include "link/link.h"
#include "support/files.h"
#include "support/gsm.h"
#include "support/lock_within.h"
#include "support/settings_store.h"
#include "support/text.h"

namespace vqm {

namespace {

// UCS2 characters a record's body holds: four digits each and the NUL.
constexpr size_t kUcs2Room = (sizeof(SmsRecord::text) - 1) / 4;

bool ValidFolder(int folder) {
    return folder == kFolderSim || folder == kFolderLocal;
}

std::string InstallFolder(SettingsStore& settings) {
    char16_t folder[kMaxSettingLength + 2];
    if (!GetInstallPath(settings, folder, sizeof folder / sizeof folder[0])) return {};
    return Utf16ToUtf8(folder);
}

// A record read from a file that a crash or another program may have damaged must not hand
// out unterminated texts.
void Terminate(SmsRecord* record) {
    record->number[sizeof record->number - 1] = '\0';
    record->status[sizeof record->status - 1] = '\0';
    record->date[sizeof record->date - 1] = '\0';
}

void Call(const std::function<void()>& hook) {
    if (hook) hook();
}

// The rewrite shared by delete and status change: every whole record through change (which
// may drop it by returning false) into the flushed "%s.tmp" copy, renamed over the folder
// file in one step; a folder left empty is no file.
int RewriteFolder(MessageStore& store, int folder, int index,
                  const std::function<bool(SmsRecord&)>& change) {
    if (!ValidFolder(folder) || index < 1) return 0;
    if (!StoreGuardAcquire(store, kAccessWrite)) return 0;
    const std::string path = StoreFolderPath(store, folder);
    const std::string scratch = path + ".tmp";
    int result = 0;
    FILE* out = std::fopen(scratch.c_str(), "wb");
    FILE* in = out ? std::fopen(path.c_str(), "rb") : nullptr;
    if (out && !in) {
        std::fclose(out);
        std::remove(scratch.c_str());
    } else if (out && in) {
        bool written = true;
        long kept = 0;
        SmsRecord record;
        while (std::fread(&record, 1, sizeof record, in) == sizeof record) {
            if (record.index == index && !change(record)) continue;
            written = written && std::fwrite(&record, 1, sizeof record, out) == sizeof record;
            ++kept;
        }
        std::fclose(in);
        written = FlushToDisk(out) && written;
        written = std::fclose(out) == 0 && written;
        if (!written || std::rename(scratch.c_str(), path.c_str()) != 0) {
            std::remove(scratch.c_str());
        } else {
            if (kept == 0) std::remove(path.c_str());
            result = 1;
        }
    }
    StoreGuardRelease(store);
    return result;
}

// The narrow form of an index list; empty when the setting is absent.
bool ReadList(SettingsStore& settings, const char16_t* name, std::string* list) {
    char16_t wide[kMaxSettingLength + 1];
    if (!GetSettingString(settings, name, wide, sizeof wide / sizeof wide[0])) return false;
    char narrow[kMaxSettingLength + 1];
    const int length = WideToNarrow(
        wide, narrow, static_cast<int>(WideLength(wide, kMaxSettingLength)), sizeof narrow);
    list->assign(narrow, static_cast<size_t>(length));
    return true;
}

int WriteList(SettingsStore& settings, const char16_t* name, const std::string& list) {
    // A list that does not fit is refused whole: cut, it would end in a damaged entry and lose
    // the location just added.
    if (list.size() > kMaxSettingLength) return 0;
    char16_t wide[kMaxSettingLength + 1];
    NarrowToWide(list.data(), wide, static_cast<int>(list.size()), sizeof wide / sizeof wide[0]);
    return SetSettingString(settings, name, wide);
}

struct ListEntry {
    int location;
    size_t begin, end;  // from where the walk for it began to behind its closing quote
};

// The walk over a list's quoted fields; it ends at the first field that does not close.
std::vector<ListEntry> WalkList(const std::string& list) {
    std::vector<ListEntry> entries;
    const char* begin = list.data();
    const char* end = begin + list.size();
    for (const char* p = begin; p < end;) {
        char field[16];
        int length = 0;
        const char* next = ParseQuoted(p, end, field, sizeof field, &length);
        if (!next) break;
        entries.push_back(
            {std::atoi(field), static_cast<size_t>(p - begin), static_cast<size_t>(next - begin)});
        p = next;
    }
    return entries;
}

std::string QuotedLocation(int location) {
    return "\"" + std::to_string(location) + "\"";
}

// "yy/MM/dd,hh:mm:ss" to "hh:mm:ss,dd/MM/20yy"; a date of another shape is left empty.
void ReorderPcDate(const char* in, size_t inSize, char (&out)[20]) {
    std::memset(out, 0, sizeof out);
    if (strnlen(in, inSize) < 17) return;
    std::snprintf(out, sizeof out, "%.8s,%.2s/%.2s/20%.2s", in + 9, in + 6, in + 3, in);
}

}  // namespace

MessageStore::~MessageStore() {
    if (refresh.joinable()) refresh.join();
}

void StoreGuardCreate(MessageStore& store) {
    std::lock_guard<std::mutex> lock(store.guardMutex);
    store.access = kAccessFree;
}

void StoreGuardDestroy(MessageStore& store) {
    // A writer holds the store for a record's copy at most; twenty claims are ten seconds.
    for (int attempt = 0; attempt < 20; ++attempt) {
        if (StoreGuardAcquire(store, kAccessWrite)) {
            StoreGuardRelease(store);
            return;
        }
    }
}

int StoreGuardAcquire(MessageStore& store, int access) {
    if (!LockWithin(store.guardMutex, kStoreGuardWaitMs)) return 0;
    int granted = 0;
    if (access == kAccessRead && store.access != kAccessWrite) {
        store.access = kAccessRead;
        granted = 1;
    } else if (access == kAccessWrite && store.access == kAccessFree) {
        store.access = kAccessWrite;
        granted = 1;
    }
    store.guardMutex.unlock();
    return granted;
}

void StoreGuardRelease(MessageStore& store) {
    if (!LockWithin(store.guardMutex, kStoreGuardWaitMs)) return;
    store.access = kAccessFree;
    store.guardMutex.unlock();
}

std::string StoreFolderPath(MessageStore& store, int folder) {
    if (!ValidFolder(folder)) return {};
    return InstallFolder(store.settings) + (folder == kFolderSim ? "smsmsg1.db" : "smsmsg2.db");
}

std::string ClipboardPath(MessageStore& store) {
    return InstallFolder(store.settings) + "sm_clipbd.txt";
}

std::string PcMessagesPath(MessageStore& store) {
    return InstallFolder(store.settings) + "pcmsg.txt";
}

namespace {

// StoreOpen that says whether the guard was granted: a caller whose claim was refused must not
// release the claim of whoever holds the store.
FILE* OpenClaimed(MessageStore& store, int folder, int access, bool* claimed) {
    *claimed = false;
    if (!ValidFolder(folder) || (access != kAccessRead && access != kAccessWrite)) return nullptr;
    if (!StoreGuardAcquire(store, access)) return nullptr;
    *claimed = true;
    const std::string path = StoreFolderPath(store, folder);
    if (access == kAccessWrite) DropPartialTail(path, kSmsRecordSize);
    return std::fopen(path.c_str(), access == kAccessRead ? "rb" : "ab");
}

void CloseClaimed(MessageStore& store, FILE* file, bool claimed) {
    if (file) std::fclose(file);
    if (claimed) StoreGuardRelease(store);
}

}  // namespace

FILE* StoreOpen(MessageStore& store, int folder, int access) {
    bool claimed = false;
    return OpenClaimed(store, folder, access, &claimed);
}

void StoreClose(MessageStore& store, FILE* file) {
    if (file) std::fclose(file);
    StoreGuardRelease(store);
}

int StoreNextIndex(MessageStore& store, int folder) {
    bool claimed = false;
    FILE* file = OpenClaimed(store, folder, kAccessRead, &claimed);
    if (!file) {
        CloseClaimed(store, nullptr, claimed);
        return 1;
    }
    int smallest = 10000, largest = 0, count = 0;
    SmsRecord record;
    while (std::fread(&record, 1, sizeof record, file) == sizeof record) {
        if (record.index < smallest) smallest = record.index;
        if (record.index > largest) largest = record.index;
        ++count;
    }
    CloseClaimed(store, file, claimed);
    if (count == 0) return 1;
    return smallest >= 2 ? smallest - 1 : largest + 1;
}

int StoreReadAt(MessageStore& store, int folder, long offset, SmsRecord* record) {
    if (!ValidFolder(folder) || offset < 0 || !record) return 0;
    bool claimed = false;
    FILE* file = OpenClaimed(store, folder, kAccessRead, &claimed);
    bool read = file && std::fseek(file, offset, SEEK_SET) == 0 &&
                std::fread(record, 1, sizeof *record, file) == sizeof *record;
    CloseClaimed(store, file, claimed);
    if (!read) return 0;
    Terminate(record);
    return record->length >= 1 && record->length <= 639 ? 1 : 0;
}

int StoreAppend(MessageStore& store, int folder, const SmsRecord& record) {
    if (!ValidFolder(folder)) return 0;
    bool claimed = false;
    FILE* file = OpenClaimed(store, folder, kAccessWrite, &claimed);
    if (!file) {
        CloseClaimed(store, nullptr, claimed);
        return 0;
    }
    const bool written =
        std::fwrite(&record, 1, sizeof record, file) == sizeof record && FlushToDisk(file);
    CloseClaimed(store, file, claimed);
    return written ? 1 : 0;
}

int StoreDelete(MessageStore& store, int folder, int index) {
    return RewriteFolder(store, folder, index, [](SmsRecord&) { return false; });
}

int StoreSetStatus(MessageStore& store, int folder, int index, const char* status) {
    if (!status) return 0;
    return RewriteFolder(store, folder, index, [status](SmsRecord& record) {
        std::memset(record.status, 0, sizeof record.status);
        std::strncpy(record.status, status, sizeof record.status - 1);
        return true;
    });
}

int StoreExists(MessageStore& store) {
    for (int folder : {kFolderSim, kFolderLocal}) {
        if (FILE* file = std::fopen(StoreFolderPath(store, folder).c_str(), "rb")) {
            std::fclose(file);
            return 1;
        }
    }
    return 0;
}

bool StoreReadAll(MessageStore& store, int folder, std::vector<SmsRecord>* records) {
    records->clear();
    if (!ValidFolder(folder)) return false;
    if (!StoreGuardAcquire(store, kAccessRead)) return false;
    if (FILE* file = std::fopen(StoreFolderPath(store, folder).c_str(), "rb")) {
        SmsRecord record;
        while (std::fread(&record, 1, sizeof record, file) == sizeof record) {
            Terminate(&record);
            records->push_back(record);
        }
        std::fclose(file);
    }
    StoreGuardRelease(store);
    return true;
}

int StoreRefreshSim(MessageStore& store, Link& link) {
    int32_t used = 0, total = 0;
    if (!SmsSelectSimStorage(link, &used, &total) || SmsSetFormat(link, kSmsModePdu) != 0 ||
        !StoreGuardAcquire(store, kAccessWrite))
        return 0;
    const std::string path = StoreFolderPath(store, kFolderSim);
    int count = 0;
    for (int location = 1; location <= total && count < used; ++location) {
        SmsRecord record{};
        record.index = location;
        if (!SmsRead(link, kSmsModePdu, &record)) {
            // A pulled card answers nothing more: stop rather than wait out every location.
            if (link.portState.load() == 0) break;
            continue;
        }
        if (FILE* file = std::fopen(path.c_str(), "ab")) {
            std::fwrite(&record, 1, sizeof record, file);
            std::fclose(file);
            ++count;
        }
    }
    StoreGuardRelease(store);
    return count;
}

void StoreStartSimRefresh(MessageStore& store, Link& link, std::function<void()> done) {
    StoreJoinRefresh(store);
    if (StoreExists(store)) std::remove(StoreFolderPath(store, kFolderSim).c_str());
    store.refreshRunning = true;
    store.refresh = std::thread([&store, &link, done = std::move(done)] {
        StoreRefreshSim(store, link);
        if (done) done();
        // Cleared only once the notice was taken, so a waiter that delivers it sees it through.
        store.refreshRunning = false;
    });
}

void StoreJoinRefresh(MessageStore& store) {
    if (store.refresh.joinable()) store.refresh.join();
}

int IndexListContains(SettingsStore& settings, const char16_t* name, int location) {
    std::string list;
    if (location < 1 || !ReadList(settings, name, &list)) return 0;
    for (const ListEntry& entry : WalkList(list))
        if (entry.location == location) return 1;
    return 0;
}

int IndexListAdd(SettingsStore& settings, const char16_t* name, int location) {
    if (location < 1) return 0;
    std::string list;
    if (!ReadList(settings, name, &list))
        return WriteList(settings, name, QuotedLocation(location));
    const std::vector<ListEntry> entries = WalkList(list);
    for (const ListEntry& entry : entries)
        if (entry.location == location) return 1;
    // Whatever follows the last whole entry (an entry cut short, left by a damaged store) is
    // unreadable; kept in front of the new location it would swallow that too.
    list.resize(entries.empty() ? 0 : entries.back().end);
    return WriteList(settings, name, list + QuotedLocation(location));
}

int IndexListRemove(SettingsStore& settings, const char16_t* name, int location) {
    if (location < 1) return 0;
    std::string list;
    if (!ReadList(settings, name, &list)) return 1;
    for (const ListEntry& entry : WalkList(list)) {
        if (entry.location != location) continue;
        list.erase(entry.begin, entry.end - entry.begin);
        return WriteList(settings, name, list);
    }
    return 1;
}

int IndexListCount(SettingsStore& settings, const char16_t* name) {
    std::string list;
    if (!ReadList(settings, name, &list)) return 0;
    return static_cast<int>(WalkList(list).size());
}

std::vector<int> IndexListEntries(SettingsStore& settings, const char16_t* name) {
    std::vector<int> locations;
    std::string list;
    if (!ReadList(settings, name, &list)) return locations;
    for (const ListEntry& entry : WalkList(list))
        locations.push_back(entry.location);
    return locations;
}

int UnreadMessageCount(SettingsStore& settings) {
    std::vector<int> locations = IndexListEntries(settings, kNewIdx);
    for (int location : IndexListEntries(settings, kUnreadIdx))
        if (std::find(locations.begin(), locations.end(), location) == locations.end())
            locations.push_back(location);
    return static_cast<int>(std::count_if(locations.begin(), locations.end(),
                                          [](int location) { return location > 0; }));
}

int SmsNoteNewMessage(SettingsStore& settings, int simFull, int location,
                      const std::function<void(int full)>& simFullAlert) {
    if (simFull == 1 && simFullAlert) simFullAlert(1);
    return IndexListAdd(settings, kNewIdx, location);
}

int SmsNoteNewMessageAgain(SettingsStore& settings, int location) {
    return IndexListAdd(settings, kNewIdx, location);
}

int SmsIntakeNew(MessageStore& store, Link& link) {
    if (!SmsIntakeRead(store, link)) return 0;
    SmsIntakeFile(store);
    return 1;
}

int SmsIntakeRead(MessageStore& store, Link& link) {
    std::string list;
    if (!ReadList(store.settings, kNewIdx, &list)) return 0;
    Call(store.hooks.beginBusy);
    if (SmsSetFormat(link, kSmsModePdu) != 0) {
        Call(store.hooks.endBusy);
        return 0;
    }
    for (const ListEntry& entry : WalkList(list)) {
        if (entry.location <= 0) continue;
        SmsRecord record{};
        record.index = entry.location;
        if (!SmsRead(link, kSmsModePdu, &record) || !ClipboardAppend(store, record)) {
            Call(store.hooks.endBusy);
            return 0;
        }
    }
    Call(store.hooks.endBusy);
    return 1;
}

void SmsIntakeFile(MessageStore& store) {
    if (store.hooks.pasteInto) store.hooks.pasteInto(kPageInbox);
    Call(store.hooks.selectFirstUnread);
}

int ClipboardAppend(MessageStore& store, const SmsRecord& record) {
    // A kill in the middle of an earlier append can leave part of an entry at the end.
    DropPartialTail(ClipboardPath(store), kClipboardEntrySize);
    FILE* file = std::fopen(ClipboardPath(store).c_str(), "ab");
    if (!file) return 0;
    ClipboardEntry entry{};
    entry.record = record;
    const bool written = std::fwrite(&entry, 1, sizeof entry, file) == sizeof entry;
    return std::fclose(file) == 0 && written ? 1 : 0;
}

int ClipboardCopyRecord(MessageStore& store, const SmsRecord& record) {
    if (!ClipboardAppend(store, record)) return 0;
    if (store.hooks.pasteInto) store.hooks.pasteInto(kPageSent);
    return 1;
}

int ClipboardCopyText(MessageStore& store, const char16_t* text, size_t count) {
    SmsRecord record{};
    if (RecordBodyFromText(text, count, &record) < 1) return 0;
    if (!ClipboardAppend(store, record)) return 0;
    if (store.hooks.pasteInto) store.hooks.pasteInto(kPageDraft);
    return 1;
}

int ClipboardCount(MessageStore& store) {
    std::error_code error;
    const auto size = std::filesystem::file_size(ClipboardPath(store), error);
    return error ? 0 : static_cast<int>(size / kClipboardEntrySize);
}

std::vector<ClipboardEntry> ClipboardRead(MessageStore& store) {
    std::vector<ClipboardEntry> entries;
    FILE* file = std::fopen(ClipboardPath(store).c_str(), "rb");
    if (!file) return entries;
    ClipboardEntry entry;
    while (std::fread(&entry, 1, sizeof entry, file) == sizeof entry) {
        Terminate(&entry.record);
        entries.push_back(entry);
    }
    std::fclose(file);
    return entries;
}

void ClipboardRemove(MessageStore& store) {
    std::remove(ClipboardPath(store).c_str());
}

int RecordBodyFromText(const char16_t* text, size_t count, SmsRecord* record) {
    const size_t bytes = count * sizeof(char16_t);
    if (CanUseGsmAlphabet(text, bytes)) {
        record->coding = 0;
        record->length =
            WideToNarrow(text, record->text, static_cast<int>(count), sizeof record->text);
    } else {
        record->coding = 8;
        record->length = TextToUcs2Hex(text, std::min(count, kUcs2Room) * sizeof(char16_t),
                                       record->text, sizeof record->text);
    }
    return record->length;
}

void StampLocalTime(SmsRecord* record) {
    const std::time_t now = std::chrono::system_clock::to_time_t(std::chrono::system_clock::now());
    std::tm local{};
    localtime_r(&now, &local);
    char text[64];
    std::snprintf(text, sizeof text, "%02d:%02d:%02d,%02d/%02d/%d", local.tm_hour, local.tm_min,
                  local.tm_sec, local.tm_mday, local.tm_mon + 1, local.tm_year + 1900);
    std::memset(record->date, 0, sizeof record->date);
    std::memcpy(record->date, text, strnlen(text, sizeof record->date - 1));
}

int ImportPcMessages(MessageStore& store) {
    const std::string path = PcMessagesPath(store);
    FILE* file = std::fopen(path.c_str(), "rb");
    if (!file) return 0;
    int taken = 0;
    PcMessage pc;
    while (std::fread(&pc, 1, sizeof pc, file) == sizeof pc) {
        SmsRecord record{};
        const std::string folder(pc.folder, strnlen(pc.folder, sizeof pc.folder));
        if (folder == "DRAFT")
            std::strcpy(record.status, "PDA DRAFT");
        else if (folder == "PDA")
            std::strcpy(record.status, "PDA PDA");
        else if (folder == "STO SENT")
            std::strcpy(record.status, "STO SENT");
        else
            continue;
        record.index = StoreNextIndex(store, kFolderLocal);
        if (folder != "DRAFT") {
            std::memcpy(record.number, pc.number, sizeof record.number);
            record.number[sizeof record.number - 1] = '\0';
            ReorderPcDate(pc.date, sizeof pc.date, record.date);
        }
        // The companion writes the card's 8-bit text; what the GSM alphabet cannot carry is
        // kept as UCS2.
        const size_t textLength = strnlen(pc.text, sizeof pc.text);
        char16_t wide[sizeof pc.text + 1];
        const int count =
            NarrowToWide(pc.text, wide, static_cast<int>(textLength), sizeof wide / sizeof wide[0]);
        if (CanUseGsmAlphabet(wide, static_cast<size_t>(count) * sizeof(char16_t))) {
            record.coding = 0;
            const size_t copied = std::min(textLength, sizeof record.text - 1);
            std::memcpy(record.text, pc.text, copied);
            record.length = static_cast<int32_t>(copied);
        } else {
            record.coding = 8;
            const size_t units = std::min<size_t>(static_cast<size_t>(count), kUcs2Room);
            record.length =
                TextToUcs2Hex(wide, units * sizeof(char16_t), record.text, sizeof record.text);
        }
        if (StoreAppend(store, kFolderLocal, record)) ++taken;
    }
    std::fclose(file);
    // An older backup is never replaced: the file then stays and is taken in again next time.
    std::error_code error;
    if (!std::filesystem::exists(path + ".bak", error))
        std::rename(path.c_str(), (path + ".bak").c_str());
    return taken;
}

}  // namespace vqm
