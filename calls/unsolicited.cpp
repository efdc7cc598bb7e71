#include "calls/unsolicited.h"

#include <cstring>

#include "support/text.h"

namespace vqm {

void UnsolicitedEvents::SetHandler(EventType type, EventHandler handler) {
    if (type < handlers_.size()) handlers_[type] = std::move(handler);
}

int UnsolicitedEvents::UnsolicitedScan(const char* reply, int length) {
    if (!reply || length <= 0) return 0;
    const char* end = reply + length;
    int result = 0;
    for (size_t row = 0; row < kUnsolicitedCodes.size(); ++row) {
        const UnsolicitedCode& code = kUnsolicitedCodes[row];
        for (int at = FindPattern(0, code.tag, code.tagLength, reply, length); at >= 0;
             at = FindPattern(at + code.tagLength, code.tag, code.tagLength, reply, length)) {
            EventRecord record =
                MakeEventRecord(static_cast<uint8_t>(row), reply + at, end, now_());
            result = log_.EventLogAppend(record);
        }
    }
    return result;
}

int UnsolicitedEvents::QueueLine(const char* line, int length) {
    if (!line || length <= 0) return 0;
    for (size_t row = 0; row < kUnsolicitedCodes.size(); ++row) {
        const UnsolicitedCode& code = kUnsolicitedCodes[row];
        if (length >= code.tagLength && std::memcmp(line, code.tag, code.tagLength) == 0)
            return log_.EventLogAppend(
                MakeEventRecord(static_cast<uint8_t>(row), line, line + length, now_()));
    }
    return 0;
}

int UnsolicitedEvents::DispatchEvent(const EventRecord& record) {
    if (record.type >= handlers_.size() || !handlers_[record.type]) return 0;
    return handlers_[record.type](record);
}

int UnsolicitedEvents::DispatchOldest() {
    std::lock_guard<std::mutex> lock(dispatchMutex_);
    EventRecord record{};
    if (!log_.EventLogPeek(&record)) return 0;
    DispatchEvent(record);
    log_.EventLogPop(nullptr);
    return 1;
}

int UnsolicitedEvents::DispatchAll(int* rings) {
    const int count = log_.EventLogCount();
    int dispatched = 0;
    for (int i = 0; i < count; ++i) {
        std::lock_guard<std::mutex> lock(dispatchMutex_);
        EventRecord record{};
        if (!log_.EventLogPeek(&record)) break;
        DispatchEvent(record);
        log_.EventLogPop(nullptr);
        if (rings && record.type == kEventRing) ++*rings;
        ++dispatched;
    }
    return dispatched;
}

}  // namespace vqm
