#include "calls/call_log.h"

#include <chrono>
#include <cstdio>
#include <cstring>
#include <filesystem>
#include <string>

#include "support/files.h"
#include "support/settings_store.h"
#include "support/text.h"

namespace vqm {

namespace {

bool ValidLog(int logNumber) {
    return logNumber >= 1 && logNumber <= kCallLogCount;
}

std::u16string SizeSettingName(int logNumber) {
    return u"CallLogSize" + std::u16string(1, static_cast<char16_t>(u'0' + logNumber));
}

// Reads the whole records of the file; false when it cannot be opened. A record cut short by
// a crash in the middle of an append is left out.
bool ReadRecords(const std::string& path, std::vector<CallLogRecord>* records) {
    records->clear();
    FILE* file = std::fopen(path.c_str(), "rb");
    if (!file) return false;
    CallLogRecord record;
    while (std::fread(&record, 1, sizeof record, file) == sizeof record) {
        // A damaged file must not hand out unterminated texts.
        record.number[kCallLogNumberSize - 1] = '\0';
        record.time[kCallLogTimeSize - 1] = '\0';
        records->push_back(record);
    }
    std::fclose(file);
    return true;
}

// Puts records in place of the file through "<path>.tmp", flushed before the rename, so a
// crash leaves the old log or the new one. A log with nothing left is no file at all.
bool WriteRecords(const std::string& path, const std::vector<CallLogRecord>& records) {
    if (records.empty()) {
        std::remove(path.c_str());
        return true;
    }
    std::string data(records.size() * kCallLogRecordSize, '\0');
    std::memcpy(data.data(), records.data(), data.size());
    return ReplaceFile(path, data);
}

std::tm NowLocal() {
    const std::time_t now = std::chrono::system_clock::to_time_t(std::chrono::system_clock::now());
    std::tm local{};
    localtime_r(&now, &local);
    return local;
}

}  // namespace

std::string CallLogPath(CallLog& log, int logNumber) {
    if (!ValidLog(logNumber)) return {};
    char16_t folder[kMaxSettingLength + 2];
    const std::string name = "callog" + std::to_string(logNumber) + ".db";
    if (!GetInstallPath(log.settings, folder, sizeof folder / sizeof folder[0])) return name;
    return Utf16ToUtf8(folder) + name;
}

int CallLogLimit(CallLog& log, int logNumber) {
    int32_t limit = kCallLogDefaultSize;
    if (!GetSettingInt(log.settings, SizeSettingName(logNumber).c_str(), &limit))
        return kCallLogDefaultSize;
    return limit;
}

void EnsureCallLogLimits(CallLog& log) {
    for (int n = 1; n <= kCallLogCount; ++n) {
        const std::u16string name = SizeSettingName(n);
        int32_t value = 0;
        if (!GetSettingInt(log.settings, name.c_str(), &value)) {
            const int32_t initial = kCallLogDefaultSize;
            SetSettingInt(log.settings, name.c_str(), &initial);
        }
    }
}

int32_t NextCallLogSequence(const std::vector<CallLogRecord>& records) {
    if (records.empty()) return 1;
    int32_t smallest = 10000, largest = 0;
    for (const CallLogRecord& record : records) {
        if (record.sequence < smallest) smallest = record.sequence;
        if (record.sequence > largest) largest = record.sequence;
    }
    // Numbers count up from 1; once the oldest entries were dropped, the free low numbers are
    // used again, counting down.
    return smallest < 2 ? largest + 1 : smallest - 1;
}

void FormatCallLogTime(const std::tm& time, char (&out)[kCallLogTimeSize]) {
    // Room for any int, so a clock gone wrong gives a cut text rather than a short write.
    char text[80];
    std::snprintf(text, sizeof text, "%02d:%02d:%02d,%02d/%02d/%d", time.tm_hour, time.tm_min,
                  time.tm_sec, time.tm_mday, time.tm_mon + 1, time.tm_year + 1900);
    std::memset(out, 0, sizeof out);
    std::memcpy(out, text, strnlen(text, sizeof out - 1));
}

std::vector<CallLogRecord> ReadCallLog(CallLog& log, int logNumber) {
    std::vector<CallLogRecord> records;
    if (!ValidLog(logNumber)) return records;
    const std::string path = CallLogPath(log, logNumber);
    std::lock_guard<std::mutex> lock(log.mutex);
    ReadRecords(path, &records);
    return records;
}

int AddCallLogEntry(CallLog& log, int logNumber, const char* number) {
    if (!ValidLog(logNumber)) return 0;
    CallLogRecord record{};
    FormatCallLogTime(log.localTime ? log.localTime() : NowLocal(), record.time);
    if (number && std::strcmp(number, "No number") != 0)
        std::strncpy(record.number, number, kCallLogNumberSize - 1);

    const std::string path = CallLogPath(log, logNumber);
    const int limit = CallLogLimit(log, logNumber);
    bool dropped = false, written = false;
    {
        std::lock_guard<std::mutex> lock(log.mutex);
        std::vector<CallLogRecord> records;
        ReadRecords(path, &records);
        record.sequence = NextCallLogSequence(records);
        // Only a log exactly at its limit loses its oldest entry: one above it (the limit was
        // lowered) keeps everything and grows by one.
        if (static_cast<int>(records.size()) == limit && !records.empty()) {
            records.erase(records.begin());
            dropped = WriteRecords(path, records);
        }
        DropPartialTail(path, kCallLogRecordSize);
        if (FILE* file = std::fopen(path.c_str(), "a+b")) {
            written =
                std::fwrite(&record, 1, sizeof record, file) == sizeof record && FlushToDisk(file);
            written = std::fclose(file) == 0 && written;
        }
    }
    // Told outside the lock: a listener reloads through ReadCallLog.
    if (log.listener) {
        if (dropped)
            log.listener(logNumber, CallLogChange::Reloaded, nullptr);
        else if (written)
            log.listener(logNumber, CallLogChange::Appended, &record);
    }
    return written ? 1 : 0;
}

int AddAnsweredCall(CallLog& log, const char* number) {
    return AddCallLogEntry(log, kCallLogAnswered, number);
}

int AddDialedCall(CallLog& log, const char* number) {
    return AddCallLogEntry(log, kCallLogDialed, number);
}

int AddUnansweredCall(CallLog& log, const char* number) {
    return AddCallLogEntry(log, kCallLogUnanswered, number);
}

int DeleteCallLogEntry(CallLog& log, int logNumber, int32_t sequence) {
    if (!ValidLog(logNumber) || sequence <= 0) return 0;
    const std::string path = CallLogPath(log, logNumber);
    std::lock_guard<std::mutex> lock(log.mutex);
    std::vector<CallLogRecord> records;
    if (!ReadRecords(path, &records)) return 0;
    std::erase_if(records, [sequence](const CallLogRecord& r) { return r.sequence == sequence; });
    return WriteRecords(path, records) ? 1 : 0;
}

void ClearCallLog(CallLog& log, int logNumber) {
    if (!ValidLog(logNumber)) return;
    const std::string path = CallLogPath(log, logNumber);
    {
        std::lock_guard<std::mutex> lock(log.mutex);
        std::remove(path.c_str());
        // A copy left by a crash in the middle of a rewrite goes with its log.
        std::remove((path + ".tmp").c_str());
    }
    if (log.listener) log.listener(logNumber, CallLogChange::Cleared, nullptr);
}

void ClearAllCallLogs(CallLog& log) {
    for (int n = 1; n <= kCallLogCount; ++n)
        ClearCallLog(log, n);
}

}  // namespace vqm
