#include "calls/event_log.h"

#include <sys/stat.h>
#include <unistd.h>

#include <cstdio>
#include <cstring>
#include <ctime>
#include <vector>

#include "support/files.h"
#include "support/settings_store.h"
#include "support/text.h"

namespace vqm {

namespace {

void PutU16(unsigned char* at, uint16_t value) {
    at[0] = static_cast<unsigned char>(value & 0xFF);
    at[1] = static_cast<unsigned char>(value >> 8);
}

uint16_t GetU16(const unsigned char* at) {
    return static_cast<uint16_t>(at[0] | (at[1] << 8));
}

}  // namespace

SystemTime ToSystemTimeUtc(std::chrono::system_clock::time_point when) {
    using namespace std::chrono;
    std::time_t seconds = system_clock::to_time_t(when);
    std::tm utc{};
    gmtime_r(&seconds, &utc);
    auto millis = duration_cast<milliseconds>(when.time_since_epoch()).count() % 1000;
    if (millis < 0) millis += 1000;
    return SystemTime{
        static_cast<uint16_t>(utc.tm_year + 1900), static_cast<uint16_t>(utc.tm_mon + 1),
        static_cast<uint16_t>(utc.tm_wday),        static_cast<uint16_t>(utc.tm_mday),
        static_cast<uint16_t>(utc.tm_hour),        static_cast<uint16_t>(utc.tm_min),
        static_cast<uint16_t>(utc.tm_sec),         static_cast<uint16_t>(millis)};
}

void EncodeEventRecord(const EventRecord& record, unsigned char (&bytes)[kEventRecordSize]) {
    const SystemTime& t = record.time;
    const uint16_t fields[8] = {t.year, t.month,  t.dayOfWeek, t.day,
                                t.hour, t.minute, t.second,    t.milliseconds};
    for (int i = 0; i < 8; ++i)
        PutU16(bytes + 2 * i, fields[i]);
    bytes[16] = record.type;
    bytes[17] = record.length;
    std::memcpy(bytes + 18, record.text, sizeof record.text);
}

void DecodeEventRecord(const unsigned char (&bytes)[kEventRecordSize], EventRecord* record) {
    SystemTime& t = record->time;
    uint16_t* fields[8] = {&t.year, &t.month,  &t.dayOfWeek, &t.day,
                           &t.hour, &t.minute, &t.second,    &t.milliseconds};
    for (int i = 0; i < 8; ++i)
        *fields[i] = GetU16(bytes + 2 * i);
    record->type = bytes[16];
    record->length = bytes[17];
    std::memcpy(record->text, bytes + 18, sizeof record->text);
    // A damaged file must not hand out an unterminated or overlong text.
    record->text[sizeof record->text - 1] = '\0';
    size_t actual = strnlen(record->text, sizeof record->text);
    if (record->length > actual) record->length = static_cast<uint8_t>(actual);
}

EventRecord MakeEventRecord(uint8_t type, const char* line, const char* lineEnd,
                            std::chrono::system_clock::time_point when) {
    EventRecord record{};
    record.time = ToSystemTimeUtc(when);
    record.type = type;
    size_t length = 0;
    if (line && lineEnd > line) {
        const size_t available = static_cast<size_t>(lineEnd - line);
        while (length < available && length < 255 && line[length] != '\r' && line[length] != '\n')
            ++length;
        std::memcpy(record.text, line, length);
    }
    record.length = static_cast<uint8_t>(length);
    record.text[length] = '\0';
    return record;
}

std::string EventLogPath(SettingsStore& store) {
    char16_t folder[1100];
    if (!GetInstallPath(store, folder, sizeof folder / sizeof folder[0])) return "event.log";
    return Utf16ToUtf8(folder) + "event.log";
}

int EventLog::EventLogAppend(const EventRecord& record) {
    std::lock_guard<std::mutex> lock(mutex_);
    FILE* file = std::fopen(path_.c_str(), "a+b");
    if (!file) return 0;
    // A crash in the middle of an earlier append can leave part of a record at the end; a new
    // record written after it would shift every later record, so the torn tail goes first.
    struct stat info {};
    if (fstat(fileno(file), &info) == 0) {
        const off_t torn = info.st_size % static_cast<off_t>(kEventRecordSize);
        if (torn != 0 && ftruncate(fileno(file), info.st_size - torn) != 0) {
            std::fclose(file);
            return 0;
        }
    }
    unsigned char bytes[kEventRecordSize];
    EncodeEventRecord(record, bytes);
    bool ok = std::fwrite(bytes, 1, sizeof bytes, file) == sizeof bytes && FlushToDisk(file);
    std::fclose(file);
    return ok ? 1 : 0;
}

int EventLog::EventLogCount() {
    std::lock_guard<std::mutex> lock(mutex_);
    FILE* file = std::fopen(path_.c_str(), "rb");
    if (!file) return 0;
    long size = std::fseek(file, 0, SEEK_END) == 0 ? std::ftell(file) : 0;
    std::fclose(file);
    return size > 0 ? static_cast<int>(size / static_cast<long>(kEventRecordSize)) : 0;
}

int EventLog::EventLogPeek(EventRecord* recordOut) {
    std::lock_guard<std::mutex> lock(mutex_);
    FILE* log = std::fopen(path_.c_str(), "rb");
    if (!log) return 0;
    unsigned char bytes[kEventRecordSize];
    const bool whole = std::fread(bytes, 1, sizeof bytes, log) == sizeof bytes;
    std::fclose(log);
    if (!whole) return 0;
    if (recordOut) DecodeEventRecord(bytes, recordOut);
    return 1;
}

int EventLog::EventLogPop(EventRecord* recordOut) {
    std::lock_guard<std::mutex> lock(mutex_);
    const std::string tmpPath = path_ + ".tmp";
    FILE* log = std::fopen(path_.c_str(), "rb");
    if (!log) return 0;
    FILE* tmp = std::fopen(tmpPath.c_str(), "wb");
    if (!tmp) {
        std::fclose(log);
        return 0;
    }
    long size = std::fseek(log, 0, SEEK_END) == 0 ? std::ftell(log) : 0;
    const long count = size > 0 ? size / static_cast<long>(kEventRecordSize) : 0;
    std::rewind(log);
    unsigned char bytes[kEventRecordSize];
    if (std::fread(bytes, 1, sizeof bytes, log) == sizeof bytes && recordOut)
        DecodeEventRecord(bytes, recordOut);

    if (count <= 1) {
        // An empty queue is no file at all; a partial record goes with it.
        std::fclose(log);
        std::fclose(tmp);
        std::remove(path_.c_str());
        std::remove(tmpPath.c_str());
        return 1;
    }
    bool ok = true;
    for (long i = 1; i < count && ok; ++i)
        ok = std::fread(bytes, 1, sizeof bytes, log) == sizeof bytes &&
             std::fwrite(bytes, 1, sizeof bytes, tmp) == sizeof bytes;
    std::fclose(log);
    ok = ok && FlushToDisk(tmp);
    std::fclose(tmp);
    // The flushed copy replaces the log in one step, so a crash leaves the old queue or the
    // new one, never a half-written file.
    if (ok && std::rename(tmpPath.c_str(), path_.c_str()) == 0) return 1;
    // The queue is unchanged: report the pop as failed so the record is not handled twice.
    std::remove(tmpPath.c_str());
    return 0;
}

}  // namespace vqm
