// vqm-crash-soak: kills writers of every kind of file the program keeps with SIGKILL at random
// moments and checks what they leave behind.
//
// For each kind a child process appends, deletes and rewrites records through the program's own
// functions and reports each operation over a pipe: once as it begins, once more only after the
// function returned success. The parent kills the child after a random delay, then reads the
// file itself: every record reported written must be there and whole, every record reported
// deleted gone; an operation under way at the kill may have left the file as before it or as
// after it (or at one of its own steps, for the operations that are several steps by design).
// A record that is not what a writer wrote, bytes after the last whole record that are not the
// start of the record being appended at the kill, or an SQLite file that fails its integrity
// check make the file torn. The next child carries on from what the last one left; after an
// append cut short, it appends first and is killed as soon as that append returned, so that a
// writer that appends behind the cut bytes shows up as torn and lost.
//
//   vqm-crash-soak [--kills N] [--kind FILE] [--start N]
//
// Prints per kind the kills, the kills after which records were lost or the file torn, the
// appends cut short by a kill, the operations done and the kills that landed inside one, and a
// total. Exits 0 only when nothing was lost or torn.
#include <poll.h>
#include <signal.h>
#include <sqlite3.h>
#include <sys/wait.h>
#include <unistd.h>

#include <algorithm>
#include <chrono>
#include <cstdio>
#include <cstring>
#include <ctime>
#include <filesystem>
#include <fstream>
#include <functional>
#include <optional>
#include <random>
#include <sstream>
#include <string>
#include <utility>
#include <vector>

#include "calls/call_log.h"
#include "calls/event_log.h"
#include "cardsim/card_sim.h"
#include "contacts/cache_builders.h"
#include "contacts/phonebook_cache.h"
#include "messaging/message_store.h"
#include "support/settings_store.h"
#include "support/text.h"

namespace {

using namespace vqm;
namespace fs = std::filesystem;

// Keys a writer uses: enough that the files of small records grow past a page or two.
constexpr int kKeys = 120;
constexpr int kVersions = 10000;
constexpr int kCallLogLimit = 12;                // small, so that appends drop the oldest too
constexpr int kMaxDelayUs = 30000;               // a kill comes 0 to 30 ms after the fork
constexpr char kTime[] = "12:34:56,01/02/2003";  // every call log entry's and message's date

// A record as the soak knows it: which one, and which of its contents.
struct Rec {
    int key, version;
    auto operator<=>(const Rec&) const = default;
};
using State = std::vector<Rec>;

enum class OpType : int32_t { Append, Delete, Rewrite, Pop, Clear, Rebuild };
const char* const kOpNames[] = {"append", "delete", "rewrite", "pop", "clear", "rebuild"};

struct Op {
    OpType type;
    int32_t key, version, count;  // count: records of a rebuild, keys key, key + 1, ...
};

// One report on the pipe; smaller than PIPE_BUF, so each write arrives whole or not at all.
struct Report {
    char phase;  // 'B' begun, 'E' ended with success, 'F' the function reported failure
    Op op;
};

// What the parent found in a file after a kill.
struct Snapshot {
    State records;
    std::string torn;  // why the file is damaged; empty when it is not
    std::string tail;  // bytes after the last whole record of a flat file
};

using Writer = std::function<bool(const Op&)>;

// A flat file of fixed-size records: what a record's bytes are, where its key and version are
// read from, and how many of its leading bytes the writer decides (the program fills the rest).
struct Layout {
    size_t size = 0;
    std::function<std::string(int key, int version)> bytes;
    std::function<std::optional<Rec>(const char* record)> keyOf;
    size_t decided = 0;  // 0: every byte
};

struct Kind {
    std::string name;                         // the file's name in the install folder
    std::vector<std::pair<OpType, int>> mix;  // operations and their weights
    std::function<Writer(const std::string& folder)> writer;       // made in the child
    Layout flat = {};                                              // a flat file of records ...
    std::function<Snapshot(const std::string& folder)> read = {};  // ... or a file of its own
    int versions = kVersions;
    bool ordered = true;  // records keep their order in the file
    int limit = 0;        // an append to a log this long first drops its oldest record
    std::function<void(const std::string& folder, SettingsStore&)> setup = {};  // in the parent
    std::function<bool(OpType, int key)> allows = {};  // which keys an operation may pick
};

// ---- Record contents: a record's key and version decide its bytes. ----

std::string Tag(int key, int version) {
    return "K" + std::to_string(key) + "V" + std::to_string(version);
}

std::optional<Rec> ParseTag(const char* text, size_t width) {
    Rec rec{};
    if (strnlen(text, width) == width || std::sscanf(text, "K%dV%d", &rec.key, &rec.version) != 2)
        return std::nullopt;
    return rec;
}

std::function<std::optional<Rec>(const char*)> TagAt(size_t offset, size_t width) {
    return [offset, width](const char* record) { return ParseTag(record + offset, width); };
}

std::string Digits(int key, int version) {
    return std::to_string(600000000LL + key * 100000LL + version);
}

std::string Filler(int key, size_t length) {
    std::string text(length, 'a');
    for (size_t i = 0; i < length; ++i)
        text[i] = static_cast<char>('a' + (key * 7 + i) % 26);
    return text;
}

template <size_t N>
void Put(char (&field)[N], const std::string& text) {
    std::memset(field, 0, N);
    std::memcpy(field, text.data(), std::min(text.size(), N - 1));
}

template <typename T>
std::string Bytes(const T& value) {
    return std::string(reinterpret_cast<const char*>(&value), sizeof value);
}

std::tm CallTime() {
    std::tm time{};
    time.tm_hour = 12, time.tm_min = 34, time.tm_sec = 56;
    time.tm_mday = 1, time.tm_mon = 1, time.tm_year = 103;
    return time;
}

// The sequence number at the end is the program's choice.
std::string CallLogBytes(int key, int version) {
    CallLogRecord record{};
    Put(record.number, Tag(key, version));
    Put(record.time, kTime);
    return Bytes(record);
}

std::string EventText(int key, int version) {
    return Tag(key, version) + ":" + Filler(key, 20 + (key * 7 + version) % 200);
}

// 2001-09-09 01:46:40 UTC, a Sunday, and the record's eight 16-bit fields for it.
const auto kEventWhen = std::chrono::system_clock::from_time_t(1000000000);
constexpr uint16_t kEventWhenFields[8] = {2001, 9, 0, 9, 1, 46, 40, 0};

std::string EventBytes(int key, int version) {
    const std::string text = EventText(key, version);
    std::string bytes(kEventRecordSize, '\0');
    for (int i = 0; i < 8; ++i) {
        bytes[2 * i] = static_cast<char>(kEventWhenFields[i] & 0xFF);
        bytes[2 * i + 1] = static_cast<char>(kEventWhenFields[i] >> 8);
    }
    bytes[16] = static_cast<char>(key % 3);
    bytes[17] = static_cast<char>(text.size());
    return bytes.replace(18, text.size(), text);
}

// A rewrite changes only the status, so the version lives there.
SmsRecord Sms(int key, int version) {
    SmsRecord record{};
    record.index = key;
    Put(record.number, "+44" + Digits(key, 0));
    Put(record.status, "V" + std::to_string(version));
    Put(record.date, kTime);
    const std::string text = Filler(key, 100 + key * 13 % 500);
    Put(record.text, text);
    record.length = static_cast<int32_t>(text.size());
    return record;
}

std::optional<Rec> SmsKey(const char* bytes) {
    SmsRecord record;
    std::memcpy(&record, bytes, sizeof record);
    int version = -1;
    if (strnlen(record.status, sizeof record.status) == sizeof record.status ||
        std::sscanf(record.status, "V%d", &version) != 1)
        return std::nullopt;
    return Rec{record.index, version};
}

PhonebookEntry Entry(int key, int version) {
    PhonebookEntry entry{};
    entry.index = key;
    entry.type = 129;
    const std::string number = Digits(key, version), text = Tag(key, version);
    Put(entry.number, number);
    Put(entry.text, text);
    entry.numberLength = static_cast<int32_t>(number.size());
    entry.textLength = static_cast<int32_t>(text.size());
    return entry;
}

// A contact with one number of one sort only, so that it lands in phonebk<file>.db alone.
AddressBookContact Contact(int file, int key, int version) {
    const std::string tag = Tag(key, version), digits = Digits(key, version);
    AddressBookContact contact;
    contact.fileAs.assign(tag.begin(), tag.end());
    std::u16string& number = file == 1   ? contact.mobile
                             : file == 2 ? contact.home
                                         : contact.business;
    number.assign(digits.begin(), digits.end());
    return contact;
}

// Its record there: the name, then the number (the first of three in the home and work files).
Layout OutlookLayout(int file) {
    const size_t size = file == 1 ? kOutlookMobileRecordSize : kOutlookNumbersRecordSize;
    return {size,
            [size](int key, int version) {
                const std::string tag = Tag(key, version), number = Digits(key, version);
                std::string bytes(size, '\0');
                return bytes.replace(0, tag.size(), tag)
                    .replace(kOutlookNameSize, number.size(), number);
            },
            TagAt(0, kOutlookNameSize)};
}

std::string SettingText(int key, int version) {
    return Tag(key, version) + ":" + Filler(key, 40 + (key * 31 + version * 17) % 900);
}

std::string CardNumber(int key) {
    return "77" + std::to_string(1000 + key);
}

// ---- Reading the files back, independently of the program's own readers. ----

bool ReadAll(const std::string& path, std::string* bytes) {
    std::ifstream file(path, std::ios::binary);
    if (!file) return false;
    std::ostringstream out;
    out << file.rdbuf();
    *bytes = out.str();
    return true;
}

// A missing file holds no records.
Snapshot ReadFlat(const std::string& path, const Layout& layout) {
    Snapshot snap;
    std::string bytes;
    if (!ReadAll(path, &bytes)) return snap;
    const size_t whole = bytes.size() - bytes.size() % layout.size;
    const size_t decided = layout.decided ? layout.decided : layout.size;
    snap.tail = bytes.substr(whole);
    for (size_t at = 0; at < whole; at += layout.size) {
        const auto rec = layout.keyOf(bytes.data() + at);
        if (rec &&
            layout.bytes(rec->key, rec->version).compare(0, decided, bytes, at, decided) == 0)
            snap.records.push_back(*rec);
        else
            snap.torn = "record " + std::to_string(at / layout.size + 1) + " is not as written";
    }
    return snap;
}

// Named values "Soak<key>" (the lower half of the keys; odd ones integers key * 100000 +
// version, even ones texts) and the entries of the "NewIdx" list (the upper half, each entry
// key * 10000 + version).
Snapshot ReadSettings(const std::string& folder) {
    Snapshot snap;
    sqlite3* db = nullptr;
    sqlite3_stmt* st = nullptr;
    const auto text = [&st](int column) {
        const unsigned char* value = sqlite3_column_text(st, column);
        return value ? std::string(reinterpret_cast<const char*>(value)) : std::string();
    };
    if (sqlite3_open_v2((folder + "/settings.db").c_str(), &db, SQLITE_OPEN_READWRITE, nullptr) !=
        SQLITE_OK) {
        sqlite3_close(db);
        snap.torn = "the store does not open";
        return snap;
    }
    std::string verdict;
    sqlite3_prepare_v2(db, "PRAGMA integrity_check", -1, &st, nullptr);
    while (st && sqlite3_step(st) == SQLITE_ROW)
        verdict += text(0);
    sqlite3_finalize(st);
    if (verdict != "ok") snap.torn = "integrity check: " + verdict;
    sqlite3_prepare_v2(db, "SELECT name, type, ivalue, svalue FROM settings", -1, &st, nullptr);
    while (st && sqlite3_step(st) == SQLITE_ROW) {
        const std::string name = text(0), value = text(3);
        const bool isInt = sqlite3_column_int(st, 1) == 0;
        const long long number = sqlite3_column_int64(st, 2);
        int key = 0;
        if (std::sscanf(name.c_str(), "Soak%d", &key) == 1) {
            const auto rec = ParseTag(value.c_str(), value.size() + 1);
            if (key % 2 == 1 && isInt && number / 100000 == key)
                snap.records.push_back({key, static_cast<int>(number % 100000)});
            else if (key % 2 == 0 && !isInt && rec && rec->key == key &&
                     value == SettingText(key, rec->version))
                snap.records.push_back(*rec);
            else
                snap.torn = "the value of " + name + " is not as written";
        } else if (name == "NewIdx") {
            for (size_t at = 0, used = 0; at < value.size(); at += used) {
                int location = 0, n = 0;
                if (std::sscanf(value.c_str() + at, "\"%d\"%n", &location, &n) != 1 || n == 0) {
                    snap.torn = "NewIdx is damaged: " + value;
                    break;
                }
                snap.records.push_back({location / 10000, location % 10000});
                used = static_cast<size_t>(n);
            }
        }
    }
    sqlite3_finalize(st);
    sqlite3_close(db);
    return snap;
}

// The simulated card's kept state: the busy (version 0) and unanswered (1) numbers are the
// records; every other line must stand as it did before the first writer began.
Snapshot ReadCard(const std::string& folder) {
    Snapshot snap;
    std::string bytes, start;
    if (!ReadAll(folder + "/card.state", &bytes) || !ReadAll(folder + "/card.start", &start)) {
        snap.torn = "the state file is missing";
        return snap;
    }
    if (bytes.empty() || bytes.back() != '\n') snap.torn = "the last line is cut short";
    std::istringstream lines(bytes);
    std::string line, others;
    while (std::getline(lines, line)) {
        int number = 0;
        if (std::sscanf(line.c_str(), "busy 77%d", &number) == 1)
            snap.records.push_back({number - 1000, 0});
        else if (std::sscanf(line.c_str(), "unanswered 77%d", &number) == 1)
            snap.records.push_back({number - 1000, 1});
        else
            others += line + "\n";
    }
    if (others != start) snap.torn = "the card's other state changed";
    return snap;
}

// ---- The writers: each calls the program's own functions and nothing else. ----

SettingsStore& OpenSettings(const std::string& folder) {
    // Nothing a writer makes is destroyed: the child ends by SIGKILL.
    return *new SettingsStore(folder + "/settings.db");
}

Writer SettingsWriter(const std::string& folder) {
    SettingsStore& settings = OpenSettings(folder);
    return [&settings](const Op& op) {
        if (op.key > kKeys / 2)
            return (op.type == OpType::Append ? IndexListAdd : IndexListRemove)(
                       settings, kNewIdx, op.key * 10000 + op.version) == 1;
        const std::u16string name = Utf8ToUtf16("Soak" + std::to_string(op.key));
        const int32_t number = op.key * 100000 + op.version;
        if (op.key % 2 == 1) return SetSettingInt(settings, name.c_str(), &number) == 1;
        const std::u16string text = Utf8ToUtf16(SettingText(op.key, op.version));
        return SetSettingString(settings, name.c_str(), text.c_str()) == 1;
    };
}

Writer CallLogWriter(int n, const std::string& folder) {
    auto* log = new CallLog(OpenSettings(folder));
    log->localTime = CallTime;
    return [n, log](const Op& op) {
        if (op.type == OpType::Append)
            return AddCallLogEntry(*log, n, Tag(op.key, op.version).c_str()) == 1;
        for (const CallLogRecord& record : ReadCallLog(*log, n)) {
            const auto rec = ParseTag(record.number, sizeof record.number);
            if (rec && rec->key == op.key) return DeleteCallLogEntry(*log, n, record.sequence) == 1;
        }
        return false;
    };
}

Writer EventLogWriter(const std::string& folder) {
    auto* log = new EventLog(EventLogPath(OpenSettings(folder)));
    return [log](const Op& op) {
        if (op.type == OpType::Pop) return log->EventLogPop(nullptr) == 1;
        const std::string text = EventText(op.key, op.version);
        return log->EventLogAppend(MakeEventRecord(static_cast<uint8_t>(op.key % 3), text.data(),
                                                   text.data() + text.size(), kEventWhen)) == 1;
    };
}

Writer MessageFolderWriter(int number, const std::string& folder) {
    auto* store = new MessageStore(OpenSettings(folder));
    StoreGuardCreate(*store);
    return [number, store](const Op& op) {
        const std::string status = "V" + std::to_string(op.version);
        if (op.type == OpType::Append) return StoreAppend(*store, number, Sms(op.key, op.version));
        if (op.type == OpType::Delete) return StoreDelete(*store, number, op.key);
        return StoreSetStatus(*store, number, op.key, status.c_str());
    };
}

Writer TransferWriter(const std::string& folder) {
    auto* store = new MessageStore(OpenSettings(folder));
    return [store](const Op& op) {
        if (op.type == OpType::Append) return ClipboardAppend(*store, Sms(op.key, op.version));
        ClipboardRemove(*store);
        return 1;
    };
}

Writer SimCacheWriter(int file, const std::string& folder) {
    auto* caches = new PhonebookCaches(OpenSettings(folder));
    return [file, caches](const Op& op) {
        const PhonebookEntry entry = Entry(op.key, op.version);
        if (op.type == OpType::Append) return SimCacheAppend(caches->sim, file, entry);
        if (op.type == OpType::Delete) return SimCacheRemove(caches->sim, file, op.key);
        return SimCacheReplace(caches->sim, file, entry);
    };
}

// The address-book cache is only ever rebuilt from the whole address book, or cleared.
Writer OutlookWriter(int file, const std::string& folder) {
    auto* caches = new PhonebookCaches(OpenSettings(folder));
    caches->pause = [](int) {};
    return [file, caches](const Op& op) {
        AddressBookResult book;
        book.opened = true;
        for (int i = 0; i < op.count; ++i)
            book.contacts.push_back(Contact(file, op.key + i, op.version));
        if (op.type == OpType::Clear)
            OutlookCacheClear(*caches, {});
        else
            OutlookCacheRebuild(*caches, [book] { return book; }, {}, {});
        caches->workers.JoinAll();
        return true;
    };
}

cardsim::SimConfig CardConfig(const std::string& folder) {
    cardsim::SimConfig config;
    config.stateFile = folder + "/card.state";
    return config;
}

Writer CardWriter(const std::string& folder) {
    auto* card = new cardsim::CardSim(CardConfig(folder));
    return [card](const Op& op) {
        const char* command = op.type == OpType::Delete ? "reachable "
                              : op.version == 0         ? "busy "
                                                        : "unanswered ";
        return card->Control(command + CardNumber(op.key)) == "OK";
    };
}

std::vector<Kind> Kinds() {
    using enum OpType;
    // As many deletes as appends: the files wander between empty and full.
    const std::vector<std::pair<OpType, int>> edits = {{Append, 1}, {Delete, 1}, {Rewrite, 1}};
    std::vector<Kind> kinds;
    kinds.push_back({.name = "settings.db",
                     .mix = {{Append, 3}, {Rewrite, 2}, {Delete, 2}},
                     .writer = SettingsWriter,
                     .read = ReadSettings,
                     .ordered = false,
                     // Named values are written and rewritten, list entries added and removed.
                     .allows = [](OpType type, int key) {
                         return type == Append || (type == Rewrite) == (key <= kKeys / 2);
                     }});
    for (int n = 1; n <= kCallLogCount; ++n)
        kinds.push_back({.name = "callog" + std::to_string(n) + ".db",
                         .mix = {{Append, 3}, {Delete, 1}},
                         .writer = std::bind_front(CallLogWriter, n),
                         .flat = {kCallLogRecordSize, CallLogBytes, TagAt(0, kCallLogNumberSize),
                                  offsetof(CallLogRecord, sequence)},
                         .limit = kCallLogLimit,
                         .setup = [n](const std::string&, SettingsStore& settings) {
                             const std::u16string name =
                                 u"CallLogSize" + Utf8ToUtf16(std::to_string(n));
                             SetSettingInt(settings, name.c_str(), &kCallLogLimit);
                         }});
    kinds.push_back({.name = "event.log",
                     .mix = {{Append, 1}, {Pop, 1}},
                     .writer = EventLogWriter,
                     .flat = {kEventRecordSize, EventBytes, TagAt(18, 256)}});
    for (int n : {kFolderSim, kFolderLocal})
        kinds.push_back(
            {.name = "smsmsg" + std::to_string(n) + ".db",
             .mix = edits,
             .writer = std::bind_front(MessageFolderWriter, n),
             .flat = {kSmsRecordSize, [](int key, int version) { return Bytes(Sms(key, version)); },
                      SmsKey}});
    // A transfer entry: two header words, always 0 as written, then the record.
    kinds.push_back(
        {.name = "sm_clipbd.txt",
         .mix = {{Append, 20}, {Clear, 1}},
         .writer = TransferWriter,
         .flat = {kClipboardEntrySize,
                  [](int key, int version) {
                      return std::string(kClipboardHeaderSize, '\0') + Bytes(Sms(key, version));
                  },
                  [](const char* entry) { return SmsKey(entry + kClipboardHeaderSize); }}});
    for (int n = 1; n <= 2; ++n)
        kinds.push_back({.name = "simphonebk" + std::to_string(n) + ".db",
                         .mix = edits,
                         .writer = std::bind_front(SimCacheWriter, n),
                         .flat = {kPhonebookEntrySize,
                                  [](int key, int version) { return Bytes(Entry(key, version)); },
                                  TagAt(offsetof(PhonebookEntry, text), kPhonebookTextSize)}});
    for (int n = 1; n <= 3; ++n)
        kinds.push_back({.name = "phonebk" + std::to_string(n) + ".db",
                         .mix = {{Rebuild, 6}, {Clear, 1}},
                         .writer = std::bind_front(OutlookWriter, n),
                         .flat = OutlookLayout(n)});
    kinds.push_back({.name = "card.state",
                     .mix = edits,
                     .writer = CardWriter,
                     .read = ReadCard,
                     .versions = 2,  // busy or unanswered
                     .ordered = false,
                     .setup = [](const std::string& folder, SettingsStore&) {
                         cardsim::CardSim card(CardConfig(folder));
                         card.Control("signal 17");  // writes the state file, demo SIM and all
                         fs::copy_file(folder + "/card.state", folder + "/card.start");
                     }});
    return kinds;
}

// ---- The model both sides keep of a file. ----

// The states an operation passes through, the last being its result.
std::vector<State> Steps(const Kind& kind, State state, const Op& op) {
    switch (op.type) {
        case OpType::Append:
            if (kind.limit && static_cast<int>(state.size()) == kind.limit) {
                // The log is rewritten without its oldest record, then the new one appended.
                state.erase(state.begin());
                State dropped = state;
                state.push_back({op.key, op.version});
                return {dropped, state};
            }
            state.push_back({op.key, op.version});
            break;
        case OpType::Delete:
            std::erase_if(state, [&op](const Rec& r) { return r.key == op.key; });
            break;
        case OpType::Rewrite:
            for (Rec& rec : state)
                if (rec.key == op.key) rec.version = op.version;
            break;
        case OpType::Pop:
            if (!state.empty()) state.erase(state.begin());
            break;
        case OpType::Clear:
            state.clear();
            break;
        case OpType::Rebuild: {
            // The files go first, then the contacts are appended one by one.
            std::vector<State> steps{State{}};
            for (int i = 0; i < op.count; ++i) {
                steps.push_back(steps.back());
                steps.back().push_back({op.key + i, op.version});
            }
            return steps;
        }
    }
    return {state};
}

// The records an operation appends, in order.
State Appended(const Op& op) {
    State records;
    if (op.type == OpType::Append) records.push_back({op.key, op.version});
    for (int i = 0; op.type == OpType::Rebuild && i < op.count; ++i)
        records.push_back({op.key + i, op.version});
    return records;
}

// append asks for an append first, where the kind has them.
Op Choose(const Kind& kind, const State& state, std::mt19937& rng, bool append) {
    const auto uniform = [&rng](int low, int high) {
        return std::uniform_int_distribution<int>(low, high)(rng);
    };
    int total = 0;
    for (const auto& [type, weight] : kind.mix)
        total += weight;
    std::vector<int> versions(kKeys + 1, -1);  // of the records in the file, by key
    for (const Rec& rec : state)
        versions[rec.key] = rec.version;
    for (;;) {
        int pick = uniform(0, total - 1);
        OpType type = kind.mix.front().first;
        for (const auto& [candidate, weight] : kind.mix)
            if ((pick -= weight) < 0) {
                type = candidate;
                break;
            }
        if (std::exchange(append, false) &&
            std::any_of(kind.mix.begin(), kind.mix.end(),
                        [](const auto& entry) { return entry.first == OpType::Append; }))
            type = OpType::Append;
        Op op{type, 0, uniform(0, kind.versions - 1), 0};
        if (type == OpType::Pop || type == OpType::Clear) {
            if (state.empty()) continue;
            return op;
        }
        if (type == OpType::Rebuild) {
            op.count = uniform(1, kKeys / 2);
            op.key = uniform(1, kKeys - op.count + 1);
            return op;
        }
        // An append takes a key not in the file, a delete or rewrite one that is.
        std::vector<int> keys;
        for (int key = 1; key <= kKeys; ++key)
            if ((versions[key] >= 0) == (type != OpType::Append) &&
                (!kind.allows || kind.allows(type, key)))
                keys.push_back(key);
        if (keys.empty()) continue;
        op.key = keys[uniform(0, static_cast<int>(keys.size()) - 1)];
        // A delete names the record as it stands (a list entry is found by its whole value).
        if (type == OpType::Delete) op.version = versions[op.key];
        if (type == OpType::Rewrite) op.version = (versions[op.key] + 1) % kind.versions;
        return op;
    }
}

[[noreturn]] void RunWriter(const Kind& kind, const std::string& folder, State model,
                            uint32_t start, bool probe, int pipe) {
    std::mt19937 rng(start);
    const Writer write = kind.writer(folder);
    const auto send = [pipe](char phase, const Op& op) {
        const Report report{phase, op};
        if (::write(pipe, &report, sizeof report) != sizeof report) _exit(3);
    };
    for (bool first = true;; first = false) {
        const Op op = Choose(kind, model, rng, first && probe);
        send('B', op);
        if (!write(op)) {
            send('F', op);
            _exit(2);
        }
        send('E', op);
        model = Steps(kind, model, op).back();
    }
}

// Forks the writer, lets it run for delayUs, kills it and collects its reports. A probe is
// killed once its first operation (an append) ended instead. failed is set when the writer
// ended any other way than by the kill.
std::vector<Report> RunAndKill(const Kind& kind, const std::string& folder, const State& model,
                               uint32_t start, int delayUs, bool probe, bool* failed) {
    int fds[2];
    if (pipe(fds) != 0) return {};
    std::fflush(nullptr);
    const pid_t pid = fork();
    if (pid == 0) {
        close(fds[0]);
        RunWriter(kind, folder, model, start, probe, fds[1]);
    }
    close(fds[1]);
    std::string bytes;
    char buffer[4096];
    // Drained while the writer runs, so that a full pipe never holds it still.
    const auto deadline =
        std::chrono::steady_clock::now() + std::chrono::microseconds(probe ? 2000000 : delayUs);
    const auto ended = [&bytes] {
        for (size_t at = 0; at + sizeof(Report) <= bytes.size(); at += sizeof(Report))
            if (bytes[at] == 'E') return true;
        return false;
    };
    for (auto now = std::chrono::steady_clock::now(); now < deadline && !(probe && ended());
         now = std::chrono::steady_clock::now()) {
        const long long left = (deadline - now) / std::chrono::nanoseconds(1);
        const timespec wait{static_cast<time_t>(left / 1000000000),
                            static_cast<long>(left % 1000000000)};
        pollfd p{fds[0], POLLIN, 0};
        if (ppoll(&p, 1, &wait, nullptr) <= 0) continue;
        const ssize_t n = read(fds[0], buffer, sizeof buffer);
        if (n <= 0) break;
        bytes.append(buffer, static_cast<size_t>(n));
    }
    int status = 0;
    if (pid > 0) {
        kill(pid, SIGKILL);
        waitpid(pid, &status, 0);
    }
    *failed = pid < 0 || !WIFSIGNALED(status) || WTERMSIG(status) != SIGKILL;
    for (ssize_t n; (n = read(fds[0], buffer, sizeof buffer)) > 0;)
        bytes.append(buffer, static_cast<size_t>(n));
    close(fds[0]);
    std::vector<Report> reports(bytes.size() / sizeof(Report));
    std::memcpy(reports.data(), bytes.data(), reports.size() * sizeof(Report));
    return reports;
}

std::string Show(const State& state) {
    std::string text;
    for (const Rec& rec : state)
        text += " " + Tag(rec.key, rec.version);
    return text.empty() ? " (none)" : text;
}

struct Tally {
    int kills = 0, lost = 0, torn = 0, cut = 0, ops = 0, midOp = 0, failed = 0;
};

Tally Soak(const Kind& kind, const std::string& folder, int kills, std::mt19937& rng) {
    fs::create_directories(folder);
    {
        SettingsStore settings(folder + "/settings.db");
        SetSettingString(settings, u"InstallPath", Utf8ToUtf16(folder + "/").c_str());
        if (kind.setup) kind.setup(folder, settings);
    }
    const auto sorted = [&kind](State state) {
        if (!kind.ordered) std::sort(state.begin(), state.end());
        return state;
    };
    Tally tally;
    State committed;
    std::string lastTail;
    // The writer after a cut record is a probe: not one of the random kills.
    for (bool probe = false; tally.kills < kills;) {
        const uint32_t start = rng();
        const int delayUs = std::uniform_int_distribution<int>(0, kMaxDelayUs)(rng);
        const std::string at = (probe ? "the append after kill " : "kill ") +
                               std::to_string(tally.kills + (probe ? 0 : 1));
        std::optional<Op> inFlight;
        bool failed = false;
        for (const Report& report :
             RunAndKill(kind, folder, committed, start, delayUs, probe, &failed)) {
            if (report.phase == 'B') inFlight = report.op;
            if (report.phase == 'E') {
                committed = Steps(kind, committed, report.op).back();
                inFlight.reset();
                ++tally.ops;
            }
            if (report.phase == 'F')
                std::fprintf(stderr, "%s: the writer's %s of %s failed\n", kind.name.c_str(),
                             kOpNames[static_cast<int>(report.op.type)],
                             Tag(report.op.key, report.op.version).c_str());
        }
        if (failed) {
            ++tally.failed;
            std::fprintf(stderr, "%s, %s: the writer ended before the kill\n", kind.name.c_str(),
                         at.c_str());
        }
        std::vector<State> allowed{committed};
        if (inFlight) {
            tally.midOp += probe ? 0 : 1;
            for (State& step : Steps(kind, committed, *inFlight))
                allowed.push_back(std::move(step));
        }
        tally.kills += probe ? 0 : 1;
        probe = false;
        Snapshot found =
            kind.read ? kind.read(folder) : ReadFlat(folder + "/" + kind.name, kind.flat);
        // A kill inside an append's write can stop it at a page boundary (Linux ends a write
        // to a file there for a killed process): the start of the record being appended, which
        // the program reads past and drops before its next write, is not damage. Left alone
        // by the next writer, it stays as it was.
        if (!found.tail.empty() && found.tail != lastTail) {
            const size_t size = kind.flat.decided ? kind.flat.decided : kind.flat.size;
            const size_t decided = std::min(found.tail.size(), size);
            const State appended = inFlight ? Appended(*inFlight) : State{};
            probe = std::any_of(appended.begin(), appended.end(), [&](const Rec& rec) {
                return kind.flat.bytes(rec.key, rec.version)
                           .compare(0, decided, found.tail, 0, decided) == 0;
            });
            if (probe)
                ++tally.cut;
            else
                found.torn =
                    std::to_string(found.tail.size()) + " bytes after the last whole record";
        }
        lastTail = found.tail;
        if (!found.torn.empty()) {
            ++tally.torn;
            std::fprintf(stderr, "%s, %s: torn: %s\n", kind.name.c_str(), at.c_str(),
                         found.torn.c_str());
        }
        if (std::none_of(allowed.begin(), allowed.end(), [&](const State& state) {
                return sorted(state) == sorted(found.records);
            })) {
            ++tally.lost;
            std::fprintf(stderr, "%s, %s: expected%s%s%s\n  found%s\n", kind.name.c_str(),
                         at.c_str(), Show(committed).c_str(), inFlight ? " or, during the " : "",
                         inFlight ? kOpNames[static_cast<int>(inFlight->type)] : "",
                         Show(found.records).c_str());
        }
        // The next writer starts from what is there, so that one fault is counted once.
        committed = found.records;
    }
    return tally;
}

int Usage() {
    std::fprintf(stderr, "usage: vqm-crash-soak [--kills N] [--kind FILE] [--start N]\nkinds:");
    for (const Kind& kind : Kinds())
        std::fprintf(stderr, " %s", kind.name.c_str());
    std::fprintf(stderr, "\n");
    return 2;
}

}  // namespace

int main(int argc, char** argv) {
    int kills = 500;
    std::string only;
    uint32_t start = std::random_device{}();
    for (int i = 1; i < argc; ++i) {
        const std::string arg = argv[i];
        if (i + 1 >= argc) return Usage();
        if (arg == "--kills")
            kills = std::atoi(argv[++i]);
        else if (arg == "--kind")
            only = argv[++i];
        else if (arg == "--start")
            start = static_cast<uint32_t>(std::strtoul(argv[++i], nullptr, 10));
        else
            return Usage();
    }
    const std::vector<Kind> kinds = Kinds();
    if (kills < 1 || (!only.empty() && std::none_of(kinds.begin(), kinds.end(),
                                                    [&](const Kind& k) { return only == k.name; })))
        return Usage();
    const char* tmp = std::getenv("TMPDIR");
    std::string root = std::string(tmp && *tmp ? tmp : "/tmp") + "/vqm-crash-soak-XXXXXX";
    if (!mkdtemp(root.data())) {
        std::perror("vqm-crash-soak: mkdtemp");
        return 1;
    }
    std::printf("start %u, %d kills per kind, files in %s\n", start, kills, root.c_str());
    const char* format = "%-14s %6d %5d %5d %5d %8d %7d\n";
    std::printf("%-14s %6s %5s %5s %5s %8s %7s\n", "kind", "kills", "lost", "torn", "cut", "ops",
                "mid-op");
    Tally total;
    for (size_t i = 0; i < kinds.size(); ++i) {
        if (!only.empty() && only != kinds[i].name) continue;
        // Each kind has a generator of its own, so that --kind repeats that kind of a full run.
        // Each kind draws its own stream from the run's start number.
        std::mt19937 rng(start + 0x9E3779B9u * static_cast<uint32_t>(i + 1));
        const std::string folder = root + "/" + fs::path(kinds[i].name).stem().string();
        const Tally t = Soak(kinds[i], folder, kills, rng);
        std::printf(format, kinds[i].name.c_str(), t.kills, t.lost, t.torn, t.cut, t.ops, t.midOp);
        std::fflush(stdout);
        total.kills += t.kills, total.lost += t.lost, total.torn += t.torn, total.cut += t.cut;
        total.ops += t.ops, total.midOp += t.midOp, total.failed += t.failed;
    }
    std::printf(format, "total", total.kills, total.lost, total.torn, total.cut, total.ops,
                total.midOp);
    const bool clean = total.lost == 0 && total.torn == 0 && total.failed == 0;
    std::error_code ignored;
    if (clean)
        fs::remove_all(root, ignored);
    else
        std::printf("files kept in %s\n", root.c_str());
    return clean ? 0 : 1;
}
