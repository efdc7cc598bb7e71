#include "calls/unsolicited.h"

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

int UnsolicitedEvents::DispatchEvent(const EventRecord& record) {
    if (record.type >= handlers_.size() || !handlers_[record.type]) return 0;
    return handlers_[record.type](record);
}

int UnsolicitedEvents::DispatchOldest() {
    EventRecord record{};
    if (log_.EventLogCount() == 0 || !log_.EventLogPop(&record)) return 0;
    DispatchEvent(record);
    return 1;
}

int UnsolicitedEvents::DispatchQueued() {
    const int count = log_.EventLogCount();
    int dispatched = 0;
    for (int i = 0; i < count; ++i)
        dispatched += DispatchOldest();
    return dispatched;
}

}  // namespace vqm
