// The framer against real exchanges: the card's echoed replies and a standard modem's bare
// ones, with unsolicited lines arriving wherever a modem may send them.
#include "link/reply_framer.h"

#include <gtest/gtest.h>

#include <string>
#include <vector>

namespace vqm {
namespace {

struct Framed {
    std::string reply;
    std::vector<std::string> unsolicited;
    bool complete;
};

Framed Frame(const char* command, const std::string& bytes, size_t size = 512) {
    std::vector<char> reply(size);
    ReplyFramer framer(command, reply.data(), reply.size());
    framer.Feed(bytes.data(), bytes.size());
    return {std::string(reply.data()), framer.TakeUnsolicited(), framer.Complete()};
}

struct Exchange {
    const char* from;
    const char* command;
    std::string echo;
    std::string reply;
};

const Exchange kExchanges[] = {
    {"card", "AT+CSQ\r", "AT+CSQ\r", "\r\n+CSQ: 20,0\r\n\r\nOK\r\n"},
    {"card", "AT+CLCC\r", "AT+CLCC\r", "\r\n+CLCC: 1,1,4,0,0,+447700900123,145\r\n\r\nOK\r\n"},
    {"card", "AT+COPS?\r", "AT+COPS?\r", "\r\n+COPS: 0,2,20201\r\n\r\nOK\r\n"},
    {"card", "AT+GMR\r", "AT+GMR\r", "\r\nSW4.00\r\n\r\nOK\r\n"},
    {"card", "ATD0123456;\r", "ATD0123456;\r", "\r\nBUSY\r\n"},
    {"card", "AT+CMGS=23\r", "AT+CMGS=23\r", "\r\n> "},
    {"card", "AT+CPBR=1,2\r", "AT+CPBR=1,2\r",
     "\r\n+CPBR: 1,\"+447700900123\",145,\"Alice +CMTI: x\"\r\n"
     "+CPBR: 2,\"0123\",129,\"Bob\"\r\n\r\nOK\r\n"},
    {"modem", "AT+CSQ\r", "", "\r\n+CSQ: 20,0\r\n\r\nOK\r\n"},
    {"modem", "AT+COPS?\r", "", "\r\n+COPS: 0,0,\"Vodafone UK\"\r\n\r\nOK\r\n"},
    {"modem", "AT+GMR\r", "", "\r\nREV1\r\n\r\nOK\r\n"},
    {"modem", "AT+CLCC\r", "", "\r\nOK\r\n"},
    {"modem", "AT+CPIN=\"1234\"\r", "", "\r\n+CME ERROR: 16\r\n"},
};

TEST(ReplyFramer, CleanExchangesKeepTheReplyByteForByte) {
    for (const Exchange& e : kExchanges) {
        const Framed f = Frame(e.command, e.echo + e.reply);
        EXPECT_EQ(f.reply, e.reply) << e.from << " " << e.command;
        EXPECT_TRUE(f.unsolicited.empty()) << e.command;
        EXPECT_TRUE(f.complete) << e.command;
    }
}

// A ring may come while the command is being typed (inside the echo) or between the lines of
// the reply; wherever it comes, it is taken out once and the reply reads as without it.
TEST(ReplyFramer, AnUnsolicitedLineAnywhereIsTakenOutOnce) {
    const std::string urcs[] = {"\r\n+CRING: VOICE\r\n", "\r\n+CMTI: \"SM\",3\r\n",
                                "\r\n^RSSI: 3\r\n", "\r\n*ECAV: 1,6,1\r\n"};
    for (const Exchange& e : kExchanges) {
        const std::string stream = e.echo + e.reply;
        for (const std::string& urc : urcs) {
            for (size_t at = 0; at <= stream.size(); ++at) {
                // A modem sends each "\r\n<line>\r\n" whole: inside the reply an
                // unsolicited line comes only between two of them.
                const bool inEcho = at <= e.echo.size();
                const bool lineEdge = at == stream.size() ||
                                      (!inEcho && stream[at - 1] == '\n' && stream[at] == '\r');
                if (!inEcho && !lineEdge) continue;
                if (at > e.echo.size() && std::string(e.reply).rfind("> ") == e.reply.size() - 2 &&
                    at == stream.size())
                    continue;  // after the prompt the card waits for text, not lines
                const std::string bytes = stream.substr(0, at) + urc + stream.substr(at);
                const Framed f = Frame(e.command, bytes);
                const std::string where = std::string(e.from) + " " + e.command + " at " +
                                          std::to_string(at) + " " + urc.substr(2, 6);
                EXPECT_EQ(f.reply, e.reply) << where;
                ASSERT_EQ(f.unsolicited.size(), 1u) << where;
                EXPECT_EQ("\r\n" + f.unsolicited[0] + "\r\n", urc) << where;
                EXPECT_TRUE(f.complete) << where;
            }
        }
    }
}

TEST(ReplyFramer, TagsCountOnlyAtTheStartOfALineAndOnlyWhenForeign) {
    // The command's own tag answers it; "+CMTI:" inside a name is text.
    Framed f = Frame("AT+CPBR=1\r", "AT+CPBR=1\r\r\n+CPBR: 1,\"1\",129,\"+CMTI: \"\r\n\r\nOK\r\n");
    EXPECT_TRUE(f.unsolicited.empty());
    // A chained command answers to each of its tags.
    f = Frame("AT+CLIP=1;+CRC=1\r", "\r\n+CLIP: 1,1\r\n+CRC: 1\r\n\r\nOK\r\n");
    EXPECT_TRUE(f.unsolicited.empty());
    // A bare RING is an event, except as the answer of a dial.
    f = Frame("AT+CSQ\r", "\r\nRING\r\n\r\n+CSQ: 5,0\r\n\r\nOK\r\n");
    EXPECT_EQ(f.unsolicited, std::vector<std::string>{"RING"});
    EXPECT_EQ(f.reply, "\r\n+CSQ: 5,0\r\n\r\nOK\r\n");
    f = Frame("ATD123;\r", "\r\nNO CARRIER\r\n");
    EXPECT_TRUE(f.unsolicited.empty());
    EXPECT_TRUE(f.complete);
}

TEST(ReplyFramer, SilenceBeforeTheFinalResultIsNotTheEnd) {
    std::vector<char> reply(256);
    ReplyFramer framer("AT+CSQ\r", reply.data(), reply.size());
    framer.Feed("AT+CSQ\r\r\n+CSQ: 20,0\r\n", 21);
    EXPECT_FALSE(framer.Complete());
    framer.Feed("\r\nOK\r\n", 6);
    EXPECT_TRUE(framer.Complete());
    EXPECT_TRUE(framer.EchoSeen());
    // Line noise is no result.
    EXPECT_FALSE(Frame("AT+CLCC\r", "AT+CLCC\r\r\n\x93\x11OK\xff\r\n").complete);
}

// A ring inside a reply is handed on once the final result is in, but never while a line is
// half read; once taken, nothing waits.
TEST(ReplyFramer, EventsWaitOnlyForWholeLines) {
    std::vector<char> reply(256);
    ReplyFramer framer("AT+CLCC\r", reply.data(), reply.size());
    auto feed = [&framer](const std::string& bytes) { framer.Feed(bytes.data(), bytes.size()); };
    feed("AT+CLCC\r\r\n+CRI");
    EXPECT_FALSE(framer.EventsWaiting());
    feed("NG: VOICE\r\n");
    EXPECT_TRUE(framer.EventsWaiting());
    feed("\r\nO");
    EXPECT_FALSE(framer.EventsWaiting() || framer.Complete());
    feed("K\r\n");
    EXPECT_TRUE(framer.Complete() && framer.EventsWaiting());
    EXPECT_EQ(framer.TakeUnsolicited(), std::vector<std::string>{"+CRING: VOICE"});
    EXPECT_FALSE(framer.EventsWaiting());
    EXPECT_EQ(std::string(reply.data()), "\r\nOK\r\n");
}

TEST(ReplyFramer, ALineCutByTheEndOfAReadIsFinishedByTheNext) {
    ReplyFramer first(nullptr, nullptr, 0);
    first.Feed("\r\n+CRI", 6);
    EXPECT_TRUE(first.TakeUnsolicited().empty());
    std::vector<char> reply(256);
    ReplyFramer next("AT+CSQ\r", reply.data(), reply.size());
    next.ResumeLine(first.PartialLine());
    const std::string rest = "NG: VOICE\r\nAT+CSQ\r\r\n+CSQ: 9,0\r\n\r\nOK\r\n";
    next.Feed(rest.data(), rest.size());
    EXPECT_EQ(next.TakeUnsolicited(), std::vector<std::string>{"+CRING: VOICE"});
    EXPECT_EQ(std::string(reply.data()), "\r\n+CSQ: 9,0\r\n\r\nOK\r\n");
}

TEST(ReplyFramer, AReplyLongerThanTheBufferIsCutNotOverrun) {
    const std::string longLine(1000, 'x');
    const Framed f = Frame("AT+X\r", "AT+X\r\r\n" + longLine + "\r\n\r\nOK\r\n", 64);
    EXPECT_EQ(f.reply.size(), 63u);
    EXPECT_TRUE(f.complete);
}

}  // namespace
}  // namespace vqm
