// The handheld's own copy of the short messages: the SIM cache ("smsmsg1.db"), the local
// folder ("smsmsg2.db"), the transfer file ("sm_clipbd.txt") through which messages are filed
// into a folder, the import file a desktop companion leaves ("pcmsg.txt"), and the two lists of
// SIM locations kept as settings: "NewIdx" (announced, not yet listed) and "UnreadIdx" (listed,
// not yet opened). Folder files are bare 704-byte SmsRecords; every rewrite goes through a
// flushed "<file>.tmp" copy renamed over the file, so a crash leaves the old file or the new.
#pragma once

#include <atomic>
#include <cstddef>
#include <cstdint>
#include <cstdio>
#include <functional>
#include <mutex>
#include <string>
#include <thread>
#include <vector>

#include "messaging/sms_at.h"

namespace vqm {

struct Link;
class SettingsStore;

inline constexpr int kFolderSim = 1, kFolderLocal = 2;
inline constexpr int kAccessFree = 0, kAccessRead = 1, kAccessWrite = 2;
inline constexpr int kStoreGuardWaitMs = 500;
inline constexpr size_t kSmsRecordSize = sizeof(SmsRecord);
inline constexpr size_t kClipboardHeaderSize = 8;
inline constexpr size_t kClipboardEntrySize = kClipboardHeaderSize + kSmsRecordSize;
inline constexpr size_t kPcMessageSize = 668;
inline constexpr char16_t kNewIdx[] = u"NewIdx";
inline constexpr char16_t kUnreadIdx[] = u"UnreadIdx";

// The SMS Folder's pages; a page's paste number is its index plus 1.
inline constexpr int kPageInbox = 0, kPageOutbox = 1, kPageSent = 2, kPageDraft = 3, kPagePda = 4,
                     kPageCount = 5;

// One entry of the transfer file: two header words (always written 0; a 1 in the first would
// mark a cut, the second naming the page it was cut from) and the record.
struct ClipboardEntry {
    int32_t cut;
    int32_t sourcePage;
    SmsRecord record;
};
static_assert(sizeof(ClipboardEntry) == kClipboardEntrySize, "a transfer entry is 712 bytes");

// The import file's record, as the desktop companion writes it.
struct PcMessage {
    char unused1[31];
    char number[20];
    char unused2[11];
    char date[17];  // yy/MM/dd,hh:mm:ss
    char unused3[11];
    char folder[58];  // "DRAFT", "PDA" or "STO SENT"
    char text[520];
};
static_assert(sizeof(PcMessage) == kPcMessageSize && offsetof(PcMessage, number) == 31 &&
                  offsetof(PcMessage, date) == 62 && offsetof(PcMessage, folder) == 90 &&
                  offsetof(PcMessage, text) == 148,
              "the import record is 668 bytes");

// What the store asks of the SMS Folder view: the store files messages, the view shows them.
struct StoreHooks {
    std::function<void()> beginBusy, endBusy;
    // Shows the page (unless it shows already) and files the transfer file into it.
    std::function<void(int page)> pasteInto;
    // Selects and shows the first unread message of the Inbox, if there is one.
    std::function<void()> selectFirstUnread;
    // The full-SIM alert: 1 raises it, 0 clears it.
    std::function<void(int full)> simFullAlert;
};

struct MessageStore {
    explicit MessageStore(SettingsStore& settings) : settings(settings) {}
    // Waits for a refresh still running; its end notice goes nowhere by then.
    ~MessageStore();
    MessageStore(const MessageStore&) = delete;
    MessageStore& operator=(const MessageStore&) = delete;

    SettingsStore& settings;
    StoreHooks hooks;
    // The guard: held only for an instant to test and change the access word.
    std::mutex guardMutex;
    int access = kAccessFree;
    std::thread refresh;
    std::atomic<bool> refreshRunning{false};
};

// The guard. Create clears the word; Destroy waits (in 500 ms claims) until a write claim is
// granted and frees it, so no folder file is left half written at exit.
void StoreGuardCreate(MessageStore& store);
void StoreGuardDestroy(MessageStore& store);
// 1 when granted: a read claim unless a write is on, a write claim only when free.
int StoreGuardAcquire(MessageStore& store, int access);
void StoreGuardRelease(MessageStore& store);

// Install folder + "smsmsg1.db" (1) or "smsmsg2.db" (2); empty for another number.
std::string StoreFolderPath(MessageStore& store, int folder);
std::string ClipboardPath(MessageStore& store);
std::string PcMessagesPath(MessageStore& store);

// Takes the guard in the access asked (1 read, 2 append) and opens the folder; null when
// either fails. StoreClose closes and releases, also for a null file (so a caller whose claim
// was refused must not call it).
FILE* StoreOpen(MessageStore& store, int folder, int access);
void StoreClose(MessageStore& store, FILE* file);

// The index of a new local record: 1 for an empty folder, below the lowest when there is room
// there, else above the highest.
int StoreNextIndex(MessageStore& store, int folder);
// 1 when the record at offset was read and its length is 1 to 639.
int StoreReadAt(MessageStore& store, int folder, long offset, SmsRecord* record);
// 1 when the record was appended.
int StoreAppend(MessageStore& store, int folder, const SmsRecord& record);
// Rewrite the folder without every record of that index / with their status replaced. 1 when
// rewritten; 0 when the guard, the folder or the copy failed (the file stays as it was).
int StoreDelete(MessageStore& store, int folder, int index);
int StoreSetStatus(MessageStore& store, int folder, int index, const char* status);
// 1 when folder 1 or 2 exists.
int StoreExists(MessageStore& store);
// Every whole record of the folder under a read claim; a torn record at the end is left out.
// False when the guard was not granted.
bool StoreReadAll(MessageStore& store, int folder, std::vector<SmsRecord>* records);

// Deletes the SIM cache and reads the SIM into it again on a thread of its own; done runs on
// that thread at its end, whether or not the refresh succeeded (the view sends itself 1324).
void StoreStartSimRefresh(MessageStore& store, Link& link, std::function<void()> done);
// The refresh's body, for the thread and for tests. Returns the number of messages filed.
int StoreRefreshSim(MessageStore& store, Link& link);
// Waits for a refresh thread that was started.
void StoreJoinRefresh(MessageStore& store);

// The "NewIdx" / "UnreadIdx" lists: quoted decimal locations back to back ("\"3\"\"12\"").
// A damaged value is read as far as its quoted fields go.
int IndexListContains(SettingsStore& settings, const char16_t* name, int location);
int IndexListAdd(SettingsStore& settings, const char16_t* name, int location);
int IndexListRemove(SettingsStore& settings, const char16_t* name, int location);
int IndexListCount(SettingsStore& settings, const char16_t* name);
std::vector<int> IndexListEntries(SettingsStore& settings, const char16_t* name);
// Locations in either list, each counted once: the unread messages the DialPad announces.
int UnreadMessageCount(SettingsStore& settings);

// A "+CMTI:" location: the full-SIM alert first when simFull (SmsStorageFull's answer, asked
// off the window's thread) is 1, then the location joins "NewIdx". The second form only queues
// the location again.
int SmsNoteNewMessage(SettingsStore& settings, int simFull, int location,
                      const std::function<void(int full)>& simFullAlert);
int SmsNoteNewMessageAgain(SettingsStore& settings, int location);
// Reads every "NewIdx" location into the transfer file and files it into the Inbox. 1 when
// the new messages were taken in. The two halves apart: the card's part (any thread) and the
// filing into the folders view's pages (its own thread).
int SmsIntakeNew(MessageStore& store, Link& link);
int SmsIntakeRead(MessageStore& store, Link& link);
void SmsIntakeFile(MessageStore& store);

// Transfer file. Append one entry (header words 0); ClipboardCopyRecord then files it into the
// Sent page, the text variant (what the write view saves) into the Draft page.
int ClipboardAppend(MessageStore& store, const SmsRecord& record);
int ClipboardCopyRecord(MessageStore& store, const SmsRecord& record);
int ClipboardCopyText(MessageStore& store, const char16_t* text, size_t count);
int ClipboardCount(MessageStore& store);
std::vector<ClipboardEntry> ClipboardRead(MessageStore& store);
void ClipboardRemove(MessageStore& store);

// Files "pcmsg.txt" into the local folder and renames it to "pcmsg.txt.bak". Returns the
// number of records taken in.
int ImportPcMessages(MessageStore& store);

// Fills a zero-filled record's 7-bit or UCS2 body from typed text; the converted length, 0
// for an empty text.
int RecordBodyFromText(const char16_t* text, size_t count, SmsRecord* record);
// "hh:mm:ss,DD/MM/YYYY" of the local time now into a record's date.
void StampLocalTime(SmsRecord* record);

}  // namespace vqm
