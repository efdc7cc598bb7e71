#include "calls/unsolicited.h"

#include "tests/common/temp_folder.h"

#include <gtest/gtest.h>
#include <unistd.h>

#include <filesystem>
#include <string>
#include <vector>

namespace vqm {
namespace {

class UnsolicitedTest : public ::testing::Test {
  protected:
    int Scan(const std::string& reply) {
        return events_.UnsolicitedScan(reply.data(), static_cast<int>(reply.size()));
    }

    const testing::TempFolder temp_;
    EventLog log_{temp_ / "event.log"};
    UnsolicitedEvents events_{log_};
};

TEST_F(UnsolicitedTest, EveryOccurrenceIsQueuedRowByRow) {
    // A caller-id line before the rings still comes off after them: rows are scanned in order.
    const std::string reply =
        "\r\n+CLIP: \"+447700900123\",145\r\n\r\n+CRING: VOICE\r\n\r\n+CRING: VOICE\r\n"
        "\r\n+CMTI: \"SM\",4\r\n\r\nOK\r\n";
    EXPECT_EQ(Scan(reply), 1);
    ASSERT_EQ(log_.EventLogCount(), 4);
    std::vector<std::pair<int, std::string>> seen;
    for (EventType type : {kEventRing, kEventCallerId, kEventNewMessage})
        events_.SetHandler(type, [&](const EventRecord& r) {
            seen.emplace_back(r.type, r.text);
            return 0;
        });
    EXPECT_EQ(events_.DispatchQueued(), 4);
    EXPECT_EQ(seen, (std::vector<std::pair<int, std::string>>{{0, "+CRING: VOICE"},
                                                              {0, "+CRING: VOICE"},
                                                              {1, "+CLIP: \"+447700900123\",145"},
                                                              {2, "+CMTI: \"SM\",4"}}));
    EXPECT_EQ(log_.EventLogCount(), 0);
}

TEST_F(UnsolicitedTest, NothingQueuedForAnOrdinaryReply) {
    EXPECT_EQ(Scan("\r\n+CSQ: 20,0\r\n\r\nOK\r\n"), 0);
    EXPECT_EQ(Scan("+CRIN"), 0);  // a tag cut off at the reply's end
    EXPECT_EQ(log_.EventLogCount(), 0);
}

TEST_F(UnsolicitedTest, RowsWithoutHandlerDoNothing) {
    Scan("+CMTI: \"SM\",1\r\n");
    int rings = 0;
    events_.SetHandler(kEventRing, [&](const EventRecord&) { return ++rings; });
    EXPECT_EQ(events_.DispatchOldest(), 1);  // taken off the queue, but nobody handles it
    EXPECT_EQ(rings, 0);
    EXPECT_EQ(events_.DispatchOldest(), 0);
    EventRecord unknown{};
    unknown.type = 7;
    EXPECT_EQ(events_.DispatchEvent(unknown), 0);
}

TEST_F(UnsolicitedTest, RecordsQueuedDuringAPassWaitForTheNext) {
    Scan("+CRING: VOICE\r\n");
    int handled = 0;
    events_.SetHandler(kEventRing, [&](const EventRecord&) {
        // A handler that itself talks to the card may read another ring.
        if (++handled == 1) Scan("+CRING: VOICE\r\n");
        return 0;
    });
    EXPECT_EQ(events_.DispatchQueued(), 1);
    EXPECT_EQ(log_.EventLogCount(), 1);
    EXPECT_EQ(events_.DispatchQueued(), 1);
    EXPECT_EQ(handled, 2);
}

}  // namespace
}  // namespace vqm
