// The call log: three short histories of calls (answered, dialled, unanswered), each a flat
// file of 64-byte records in the install folder, oldest first. The call code appends; the
// Call Log view lists, deletes and clears.
#pragma once

#include <bit>
#include <cstddef>
#include <cstdint>
#include <ctime>
#include <functional>
#include <mutex>
#include <string>
#include <vector>

namespace vqm {

class SettingsStore;

inline constexpr int kCallLogAnswered = 1, kCallLogDialed = 2, kCallLogUnanswered = 3;
inline constexpr int kCallLogCount = 3;
inline constexpr int kCallLogDefaultSize = 20;
inline constexpr int kCallLogNumberSize = 32;
inline constexpr int kCallLogTimeSize = 28;

// One entry, exactly as it lies in the file.
struct CallLogRecord {
    char number[kCallLogNumberSize];  // 8-bit, NUL-terminated; empty when the call had none
    char time[kCallLogTimeSize];      // "hh:mm:ss,DD/MM/YYYY" local time, NUL-terminated
    int32_t sequence;                 // identifies the entry for deletion, within its file
};

inline constexpr size_t kCallLogRecordSize = 64;

static_assert(sizeof(CallLogRecord) == kCallLogRecordSize);
static_assert(offsetof(CallLogRecord, number) == 0);
static_assert(offsetof(CallLogRecord, time) == 32);
static_assert(offsetof(CallLogRecord, sequence) == 60);
// Records are written raw: the file's integers are little-endian only on such a machine.
static_assert(std::endian::native == std::endian::little);

// What happened to a log, for whoever shows it.
enum class CallLogChange {
    Appended,  // one record was added at the end: add it and sort
    Reloaded,  // the oldest record was dropped or entries deleted: reload the whole list
    Cleared,   // the file is gone: empty the list
};

// The call log's state: where the settings are, the clock, and who listens.
struct CallLog {
    explicit CallLog(SettingsStore& settings) : settings(settings) {}

    SettingsStore& settings;
    // The local time of a new entry; empty means the machine's own clock.
    std::function<std::tm()> localTime;
    // Told after every change to a log (log 1 to 3; record set for Appended only). It may be
    // called from the dial thread; the listener moves the work to its own thread.
    std::function<void(int log, CallLogChange change, const CallLogRecord* record)> listener;
    // The dial thread and the views may rewrite the same file at once.
    std::mutex mutex;
};

// Appends to log 1, 2 or 3 with the number shown or dialled (8-bit; "No number" stores an
// empty number; longer than 31 characters is cut). 1 when the record was written, 0 when the
// file could not be opened (the entry is lost, as a log is not worth an error).
int AddAnsweredCall(CallLog& log, const char* number);
int AddDialedCall(CallLog& log, const char* number);
int AddUnansweredCall(CallLog& log, const char* number);
int AddCallLogEntry(CallLog& log, int logNumber, const char* number);

// Deletes the file; tells the listener. ClearAllCallLogs does logs 1, 2, 3 in that order.
void ClearCallLog(CallLog& log, int logNumber);
void ClearAllCallLogs(CallLog& log);

// Rewrites the file without the records carrying that sequence number. A sequence number of
// 0 or below, or a log number other than 1 to 3, changes nothing. 1 when the file was
// rewritten. Does not tell the listener: the view reloads after deleting its selection.
int DeleteCallLogEntry(CallLog& log, int logNumber, int32_t sequence);

// Every whole record of the log in file order; a missing file is an empty log and a partial
// record at the end is ignored.
std::vector<CallLogRecord> ReadCallLog(CallLog& log, int logNumber);

// Install folder + "callog<n>.db"; empty for a bad log number.
std::string CallLogPath(CallLog& log, int logNumber);

// The limit of the log ("CallLogSize<n>", default 20), read afresh at every append.
int CallLogLimit(CallLog& log, int logNumber);
// Writes 20 for each of the three size settings that is missing (when the view is created).
void EnsureCallLogLimits(CallLog& log);

// The sequence number a new record gets after the given ones: counts up from 1 and, once the
// low numbers were dropped, down again.
int32_t NextCallLogSequence(const std::vector<CallLogRecord>& records);

// "hh:mm:ss,DD/MM/YYYY" of a local time into a 28-byte field (the rest zeroed).
void FormatCallLogTime(const std::tm& time, char (&out)[kCallLogTimeSize]);

}  // namespace vqm
