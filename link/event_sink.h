// What the link does with the unsolicited codes it finds in what it reads: the calls module
// queues and dispatches them. Declared here so that the link does not depend on it.
#pragma once

namespace vqm {

struct EventSink {
    virtual ~EventSink() = default;
    // Queues a record per unsolicited code in the text; non-zero when something was queued.
    virtual int UnsolicitedScan(const char* text, int length) = 0;
    // Queues the one unsolicited line (without its line end) when it opens with a known code;
    // non-zero when it was queued. Lines of unknown codes are ignored.
    virtual int QueueLine(const char* line, int length) = 0;
    // Hands every queued record, oldest first, to its handler; each record leaves the queue
    // once its handler has run. rings (may be null) counts the ring records among them.
    // Returns how many were dispatched.
    virtual int DispatchAll(int* rings) = 0;
};

}  // namespace vqm
