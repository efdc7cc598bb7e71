// The queue of unsolicited card events ("+CRING:", "+CLIP:", "+CMTI:"), kept in the file
// "event.log" in the install folder so that an event read in the middle of one exchange can be
// handled later, from another thread, once the port is free. Oldest record first.
#pragma once

#include <chrono>
#include <cstddef>
#include <cstdint>
#include <mutex>
#include <string>

namespace vqm {

class SettingsStore;

// A moment in UTC laid out as the 16-byte SYSTEMTIME of the record: eight unsigned 16-bit
// numbers, day of week 0 = Sunday.
struct SystemTime {
    uint16_t year, month, dayOfWeek, day, hour, minute, second, milliseconds;
};
static_assert(sizeof(SystemTime) == 16);

SystemTime ToSystemTimeUtc(std::chrono::system_clock::time_point when);

// Types are positions in the table of unsolicited codes.
enum EventType : uint8_t { kEventRing = 0, kEventCallerId = 1, kEventNewMessage = 2 };

struct EventRecord {
    SystemTime time;
    uint8_t type;
    uint8_t length;  // bytes of text, 0 to 255
    char text[256];  // NUL-terminated
};

inline constexpr size_t kEventRecordSize = 274;

// The record's bytes in the file: little-endian, fields back to back.
void EncodeEventRecord(const EventRecord& record, unsigned char (&bytes)[kEventRecordSize]);
void DecodeEventRecord(const unsigned char (&bytes)[kEventRecordSize], EventRecord* record);

// Builds a record from a reply: the text runs from the code's tag up to the first CR or LF or
// the end of the reply (lineEnd), cut to 255 bytes.
EventRecord MakeEventRecord(uint8_t type, const char* line, const char* lineEnd,
                            std::chrono::system_clock::time_point when);

// Install folder + "event.log".
std::string EventLogPath(SettingsStore& store);

class EventLog {
  public:
    explicit EventLog(std::string path) : path_(std::move(path)) {}

    const std::string& Path() const { return path_; }

    // 1 when the record was written; 0 when the file cannot be opened (the event is lost).
    int EventLogAppend(const EventRecord& record);
    // Whole records in the queue; a missing file is an empty queue.
    int EventLogCount();
    // Takes the oldest record off the queue: 1, or 0 when the log or the temporary file
    // cannot be opened. The last record's pop removes the file.
    int EventLogPop(EventRecord* recordOut);
    // Reads the oldest record without taking it off: 1, or 0 when the queue is empty.
    int EventLogPeek(EventRecord* recordOut);

  private:
    std::string path_;
    // The listener and the transactions both touch the file; each operation is whole.
    std::mutex mutex_;
};

}  // namespace vqm
