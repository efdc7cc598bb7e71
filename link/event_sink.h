// What the link does with the unsolicited codes it finds in what it reads: the calls module
// queues and dispatches them. Declared here so that the link does not depend on it.
#pragma once

namespace vqm {

struct EventSink {
    virtual ~EventSink() = default;
    // Queues a record per unsolicited code in the text; non-zero when something was queued.
    virtual int UnsolicitedScan(const char* text, int length) = 0;
    // Takes the oldest queued record and hands it to its handler; 0 when none was queued.
    virtual int DispatchOldest() = 0;
    // Dispatches as many records as were queued when called.
    virtual int DispatchQueued() = 0;
};

}  // namespace vqm
