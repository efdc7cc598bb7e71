// The unsolicited codes the card mixes into its replies ("+CRING:", "+CLIP:", "+CMTI:", "+CCWA:"):
// recognised in any text read from the port, queued in the event log, and handed one at a
// time to the handler of their row.
#pragma once

#include <array>
#include <chrono>
#include <functional>
#include <mutex>

#include "calls/event_log.h"
#include "link/event_sink.h"

namespace vqm {

using EventHandler = std::function<int(const EventRecord&)>;

struct UnsolicitedCode {
    char tag[32];
    int tagLength;
};

// Row order matters: it is the record's type and the order of the scan. The last row is a
// second caller waiting behind the call in progress.
inline constexpr std::array<UnsolicitedCode, 4> kUnsolicitedCodes = {{
    {"+CRING:", 7},
    {"+CLIP:", 6},
    {"+CMTI:", 6},
    {"+CCWA:", 6},
}};
inline constexpr EventType kEventCallWaiting = static_cast<EventType>(3);

class UnsolicitedEvents : public EventSink {
  public:
    using Clock = std::function<std::chrono::system_clock::time_point()>;

    explicit UnsolicitedEvents(EventLog& log, Clock now = std::chrono::system_clock::now)
        : log_(log), now_(std::move(now)) {}

    // Installs the handler of a row; a row without one is dispatched to nothing. Handlers are
    // installed before the link opens: the listener thread dispatches without a lock.
    void SetHandler(EventType type, EventHandler handler);

    // Queues one record per occurrence of each tag, row by row. Returns the result of the
    // last append (1 when something was queued), else 0.
    int UnsolicitedScan(const char* reply, int length) override;

    // Queues the line when it opens with one of the codes.
    int QueueLine(const char* line, int length) override;

    // Calls the handler of the record's row; 0 when the row has none or the type is unknown.
    int DispatchEvent(const EventRecord& record);

    // Dispatches the oldest record and then takes it off the queue, so a record is never
    // lost between the two; 0 when the queue was empty.
    int DispatchOldest();

    // Dispatches as many records as the queue held when called: records queued meanwhile
    // wait for the next pass. Returns how many were dispatched.
    int DispatchQueued() { return DispatchAll(nullptr); }
    int DispatchAll(int* rings) override;

    EventLog& Log() { return log_; }

  private:
    EventLog& log_;
    Clock now_;
    std::array<EventHandler, kUnsolicitedCodes.size()> handlers_;
    // One dispatcher at a time, so records are handled in the order they were queued.
    std::mutex dispatchMutex_;
};

}  // namespace vqm
