// The reply scans of the settings wrappers on hand-written replies: the layouts the card sends,
// short and truncated lists, garbage, and replies cut by the length they are given.
#include <gtest/gtest.h>

#include <cstring>
#include <string>
#include <vector>

#include "settings/barring_at.h"
#include "settings/forwarding_at.h"
#include "settings/network_at.h"
#include "settings/security_at.h"

namespace vqm {
namespace {

struct Search {
    int result = 0;
    int count = -7;
    std::vector<std::u16string> names;
};

Search ScanSearch(const std::string& reply, int maxNames = 8, int length = -1) {
    std::vector<OperatorName> names(static_cast<size_t>(maxNames) + 1);
    for (auto& name : names)
        std::memcpy(name, u"untouched", sizeof u"untouched");
    Search out;
    out.result =
        ParseOperatorSearch(reply.data(), length < 0 ? static_cast<int>(reply.size()) : length,
                            names.data(), maxNames, &out.count);
    for (int i = 0; i < maxNames + 1; ++i)
        out.names.push_back(names[i]);
    return out;
}

TEST(OperatorSearchScan, ReadsEntriesOfTheCardsLayoutInReplyOrder) {
    Search s = ScanSearch("\r\n+COPS: 2,,,20201,3,,,20205,\r\n\r\nOK\r\n");
    EXPECT_EQ(s.result, 1);
    ASSERT_EQ(s.count, 2);
    EXPECT_EQ(s.names[0], u"COSMOTE");
    EXPECT_EQ(s.names[1], u"PANAFON");  // forbidden, listed all the same
    EXPECT_EQ(s.names[2], u"untouched");

    // An empty list finds nothing but still succeeds.
    s = ScanSearch("\r\n+COPS: \r\n\r\nOK\r\n");
    EXPECT_EQ(s.result, 1);
    EXPECT_EQ(s.count, 0);
}

TEST(OperatorSearchScan, MovesByTenCharactersWhateverTheEntryLength) {
    // The six-digit code shifts everything after it: the third entry is out of step and
    // ends the scan; the second, unknown, repeats the name before it.
    Search s = ScanSearch("+COPS: 2,,,20201,1,,,202050,1,,,20210,\r\nOK\r\n");
    ASSERT_EQ(s.count, 2);
    EXPECT_EQ(s.names[0], u"COSMOTE");
    EXPECT_EQ(s.names[1], u"COSMOTE");
    // The first entry is expected after the blank that follows the tag; without the blank
    // the scan starts on a comma and finds nothing.
    s = ScanSearch("+COPS:2,,,20201,1,,,20205,");
    EXPECT_EQ(s.result, 1);
    EXPECT_EQ(s.count, 0);
}

TEST(OperatorSearchScan, UnknownCodesTakeThePreviousNameOrTheirDigitsWhenFirst) {
    Search s = ScanSearch("+COPS: 1,,,99999,1,,,20205,1,,,99998,1,,,21402,");
    ASSERT_EQ(s.count, 4);
    EXPECT_EQ(s.names[0], u"99999");
    EXPECT_EQ(s.names[1], u"PANAFON");
    EXPECT_EQ(s.names[2], u"PANAFON");
    EXPECT_EQ(s.names[3], u"MOVISTAR");
}

TEST(OperatorSearchScan, StaysInsideTheReplyAndTheList) {
    EXPECT_EQ(ScanSearch("\r\nERROR\r\n").result, -1);
    EXPECT_EQ(ScanSearch("\r\nERROR\r\n").count, -7);  // the count is left alone
    EXPECT_EQ(ScanSearch("").result, -1);
    EXPECT_EQ(ScanSearch("+COPS").result, -1);

    // Truncated in the middle of an entry: what is complete counts.
    EXPECT_EQ(ScanSearch("+COPS: 2,,,20201,1,,").count, 1);
    EXPECT_EQ(ScanSearch("+COPS: 2,,,20201,1,,,").count, 1);
    EXPECT_EQ(ScanSearch("+COPS: 2,,,20201,x,,,20205,").count, 1);

    // The given length ends the reply even where the buffer goes on.
    const std::string reply = "+COPS: 2,,,20201,1,,,20205,1,,,20210,";
    EXPECT_EQ(ScanSearch(reply, 8, 17).count, 1);
    EXPECT_EQ(ScanSearch(reply, 8, 21).count, 1);  // cut before the second code
    Search cut = ScanSearch(reply, 8, 25);         // the second code cut to 2020
    ASSERT_EQ(cut.count, 2);
    EXPECT_EQ(cut.names[1], u"COSMOTE");
    cut = ScanSearch(reply, 8, 26);  // the comma after a code is not needed
    ASSERT_EQ(cut.count, 2);
    EXPECT_EQ(cut.names[1], u"PANAFON");

    // No more names than the list holds.
    Search s = ScanSearch(reply, 2);
    EXPECT_EQ(s.count, 2);
    EXPECT_EQ(s.names[2], u"untouched");
}

// A standard modem's bracketed list: names from the table by code, the modem's own names for
// codes the table lacks, each entry's code kept for registration, and the lists of modes and
// formats after the networks not taken for networks.
TEST(OperatorSearchScan, ReadsTheStandardBracketedLayout) {
    struct Case {
        const char* reply;
        std::vector<std::u16string> names;
        std::vector<int32_t> codes;
    };
    const Case cases[] = {
        {"\r\n+COPS: (2,\"Cosmote GR\",\"COSMOTE\",\"20201\"),(1,\"vodafone GR\",\"voda\","
         "\"20205\",2),,(0,1,2,3,4),(0,1,2)\r\n\r\nOK\r\n",
         {u"COSMOTE", u"PANAFON"},
         {20201, 20205}},
        {"+COPS: (1,\"Far Away Net\",\"FAN\",\"99901\"),(3,\"\",\"Short\",\"99902\"),"
         "(1,\"\",\"\",\"99903\")\r\n",
         {u"Far Away Net", u"Short", u"99903"},
         {99901, 99902, 99903}},
        // A code that is not digits gives no code; the modem's name still shows.
        {"+COPS: (1,\"Odd\",\"O\",\"2O2O1\")\r\n", {u"Odd"}, {-1}},
        // Broken entries end the list where they break.
        {"+COPS: (2,\"Cosmote GR\",\"COSMOTE\",\"20201\"),(1,\"cut", {u"COSMOTE"}, {20201}},
        {"+COPS: (2,\"Cosmote GR\",\"COSMOTE\",\"20201\"", {u"COSMOTE"}, {20201}},
        {"+COPS: (2,\"A\",\"B\")", {}, {}},
        {"+COPS: ()\r\nOK\r\n", {}, {}},
        {"+COPS: (0,1,2,3,4),(0,1,2)\r\nOK\r\n", {}, {}},
    };
    for (const Case& c : cases) {
        std::vector<OperatorName> names(8);
        std::vector<int32_t> codes(8, -7);
        int count = -7;
        const std::string reply = c.reply;
        // The reply in a buffer of its exact size, so a read past it is a read past the heap.
        std::vector<char> exact(reply.begin(), reply.end());
        EXPECT_EQ(ParseOperatorSearch(exact.data(), static_cast<int>(exact.size()), names.data(), 8,
                                      &count, codes.data()),
                  1)
            << c.reply;
        ASSERT_EQ(count, static_cast<int>(c.names.size())) << c.reply;
        for (int i = 0; i < count; ++i) {
            EXPECT_EQ(std::u16string(names[i]), c.names[i]) << c.reply;
            EXPECT_EQ(codes[i], c.codes[i]) << c.reply;
        }
    }
}

// A hundred networks in either layout fill a list of a hundred and stop at a shorter one.
TEST(OperatorSearchScan, HundredNetworksInEitherLayout) {
    std::string card = "+COPS: ", standard = "+COPS: ";
    for (int i = 0; i < 100; ++i) {
        const int code = i % 2 ? 20201 : 90000 + i;  // unknown codes between known ones
        card += "1,,," + std::to_string(code) + ",";
        standard += std::string(i ? "," : "") + "(1,\"Net" + std::to_string(i) + "\",\"N\",\"" +
                    std::to_string(code) + "\")";
    }
    for (const std::string& reply : {card, standard}) {
        for (int room : {100, 37}) {
            std::vector<OperatorName> names(static_cast<size_t>(room));
            std::vector<int32_t> codes(static_cast<size_t>(room));
            int count = 0;
            ASSERT_EQ(ParseOperatorSearch(reply.data(), static_cast<int>(reply.size()),
                                          names.data(), room, &count, codes.data()),
                      1);
            ASSERT_EQ(count, room) << reply.substr(0, 40);
            EXPECT_EQ(codes[room - 1], room % 2 == 0 ? 20201 : 90000 + room - 1);
            EXPECT_EQ(std::u16string(names[1]), u"COSMOTE");
        }
    }
}

TEST(NetworkModeScan, ReadsTheSelectionMode) {
    const std::string manual = "\r\n+COPS: 1,2,20201\r\n\r\nOK\r\n";
    EXPECT_EQ(ParseNetworkMode(manual.data(), static_cast<int>(manual.size())), 1);
    const std::string automatic = "\r\n+COPS: 0,2,20201\r\n\r\nOK\r\n";
    EXPECT_EQ(ParseNetworkMode(automatic.data(), static_cast<int>(automatic.size())), 0);
    EXPECT_EQ(ParseNetworkMode("\r\nOK\r\n", 6), -1);
    EXPECT_EQ(ParseNetworkMode("+COPS: ,,", 9), -1);
    EXPECT_EQ(ParseNetworkMode("+COPS: 1", 6), -1);  // cut before the number
}

int Forward(const std::string& reply, std::u16string* number = nullptr, size_t size = 32) {
    std::vector<char16_t> out(size + 1, u'#');
    const int result =
        ParseForwardReply(reply.data(), static_cast<int>(reply.size()), out.data(), size);
    EXPECT_EQ(out[size], u'#');  // nothing past the given size
    if (number) *number = out.data();
    return result;
}

TEST(ForwardScan, StatusAndNumber) {
    std::u16string number;
    EXPECT_EQ(Forward("\r\n+CCFC: 1,1,\"+447700900123\",145\r\n\r\nOK\r\n", &number), 1);
    EXPECT_EQ(number, u"+447700900123");
    EXPECT_EQ(Forward("\r\n+CCFC: 1,1,\"0123\",129,,,20\r\n\r\nOK\r\n", &number), 1);
    EXPECT_EQ(number, u"0123");
    EXPECT_EQ(Forward("\r\n+CCFC: 0,7\r\n\r\nOK\r\n"), 0);
    EXPECT_EQ(Forward("\r\n+CCFC: 2,1\r\n\r\nOK\r\n"), 0);  // anything but 1 is not active
    // The first line decides, even when a later one is active.
    EXPECT_EQ(Forward("+CCFC: 0,1\r\n+CCFC: 1,4,\"99\",129\r\n"), 0);

    EXPECT_EQ(Forward("+CCFC: 1,1\r\nOK\r\n", &number), 1);  // active, no number given
    EXPECT_EQ(number, u"");
    EXPECT_EQ(Forward("+CCFC: 1,1,\"0123456789", &number), 1);  // unterminated quote
    EXPECT_EQ(number, u"");
    EXPECT_EQ(Forward("+CCFC: 1,1,\"0123456789\",129", &number, 5), 1);
    EXPECT_EQ(number, u"0123");

    EXPECT_EQ(Forward("\r\nERROR\r\n"), -1);
    EXPECT_EQ(Forward("\r\n+CCFC: \r\nOK\r\n"), -1);
    EXPECT_EQ(Forward("+CCFC:"), -1);
}

int Barring(const std::string& reply, int serviceClass) {
    return ParseBarringReply(reply.data(), static_cast<int>(reply.size()), serviceClass);
}

TEST(BarringScan, ReportedClassesAgainstTheAskedOne) {
    for (int serviceClass : {1, 2, 4})
        EXPECT_EQ(Barring("\r\n+CLCK: 1,7\r\n\r\nOK\r\n", serviceClass), 1) << serviceClass;
    EXPECT_EQ(Barring("\r\n+CLCK: 1,5\r\n\r\nOK\r\n", 2), 0);
    EXPECT_EQ(Barring("\r\n+CLCK: 1,5\r\n\r\nOK\r\n", 4), 1);
    EXPECT_EQ(Barring("\r\n+CLCK: 0,7\r\n\r\nOK\r\n", 1), 0);
    EXPECT_EQ(Barring("\r\n+CLCK: 1\r\n\r\nOK\r\n", 2), 1);

    // Without the tag the final result stands in for the state: ERROR is not "not barred".
    EXPECT_EQ(Barring("\r\nERROR\r\n", 1), 4);
    // The card's own refusal is a failure like ERROR, not a state.
    EXPECT_EQ(Barring("\r\n+CME ERROR: 16\r\n", 1), 4);
    EXPECT_EQ(Barring("\r\nOK\r\n", 1), 0);
    EXPECT_EQ(Barring("\r\ngarbage", 1), -1);
    EXPECT_EQ(Barring("\r\n+CLCK: ?\r\nOK\r\n", 1), -1);
}

// The card sums the barred classes on one line; a 27.007 modem answers one line per class.
// Either way each sub-page's class reads its own state.
TEST(BarringScan, EveryLineOfEitherLayout) {
    const std::string perClass = "\r\n+CLCK: 1,1\r\n+CLCK: 0,2\r\n+CLCK: 1,4\r\n\r\nOK\r\n";
    const std::string faxOnly = "\r\n+CLCK: 0,1\r\n+CLCK: 0,2\r\n+CLCK: 1,4\r\n\r\nOK\r\n";
    const std::string noneBarred = "\r\n+CLCK: 0,1\r\n+CLCK: 0,2\r\n+CLCK: 0,4\r\n\r\nOK\r\n";
    // Every class of 27.007 listed, only data circuit sync (16) barred: no bit of 1, 2 or 4.
    std::string eight = "\r\n";
    for (int bit = 1; bit <= 128; bit <<= 1)
        eight += "+CLCK: " + std::string(bit == 16 ? "1," : "0,") + std::to_string(bit) + "\r\n";
    eight += "\r\nOK\r\n";
    const struct {
        std::string reply;
        int voice, data, fax;  // what the sub-page of each class reads
    } cases[] = {
        // One line, summed.
        {"\r\n+CLCK: 1,7\r\n\r\nOK\r\n", 1, 1, 1},
        {"\r\n+CLCK: 1,5\r\n\r\nOK\r\n", 1, 0, 1},
        {"\r\n+CLCK: 1,4\r\n\r\nOK\r\n", 0, 0, 1},
        {"\r\n+CLCK: 0,7\r\n\r\nOK\r\n", 0, 0, 0},
        {"\r\n+CLCK: 1\r\n\r\nOK\r\n", 1, 1, 1},
        // A line per class.
        {perClass, 1, 0, 1},
        {faxOnly, 0, 0, 1},
        {noneBarred, 0, 0, 0},
        {eight, 0, 0, 0},
        {"\r\n+CLCK: 0,1\r\n+CLCK: 1,7\r\n\r\nOK\r\n", 1, 1, 1},
        {"\r\n+CLCK: 0,1\r\n+CLCK: 1\r\n\r\nOK\r\n", 1, 1, 1},
        // A later line that cannot be read is passed over; an unreadable first one is no answer.
        {"\r\n+CLCK: 0,1\r\n+CLCK: ?\r\n+CLCK: 1,4\r\n\r\nOK\r\n", 0, 0, 1},
        {"\r\n+CLCK: 1,2\r\n+CLCK:", 0, 1, 0},
        {"\r\n+CLCK: ?\r\n+CLCK: 1,7\r\n\r\nOK\r\n", -1, -1, -1},
        // A line cut off by the end of the reply.
        {"\r\n+CLCK: 0,1\r\n+CLCK: 1,", 1, 1, 1},
    };
    for (const auto& c : cases) {
        EXPECT_EQ(Barring(c.reply, 1), c.voice) << c.reply;
        EXPECT_EQ(Barring(c.reply, 2), c.data) << c.reply;
        EXPECT_EQ(Barring(c.reply, 4), c.fax) << c.reply;
    }
}

TEST(LockScan, StatusOrFinalResult) {
    auto lock = [](const std::string& reply) {
        return ParseLockReply(reply.data(), static_cast<int>(reply.size()));
    };
    EXPECT_EQ(lock("\r\n+CLCK: 1\r\n\r\nOK\r\n"), 1);
    EXPECT_EQ(lock("\r\n+CLCK: 0\r\n\r\nOK\r\n"), 0);
    EXPECT_EQ(lock("\r\n+CLCK: 1,7\r\n\r\nOK\r\n"), 1);
    EXPECT_EQ(lock("\r\nERROR\r\n"), 4);
    EXPECT_EQ(lock("\r\n+CME ERROR: 10\r\n"), 4);
    EXPECT_EQ(lock("\r\n+CLCK:"), -1);
    EXPECT_EQ(lock(""), -1);
}

}  // namespace
}  // namespace vqm
