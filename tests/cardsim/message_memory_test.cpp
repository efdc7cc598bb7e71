// The simulated card's message memory on the bare engine: replies, 27.005 errors, listing by
// status, network delivery and the kept state.
#include "cardsim/message_memory.h"

#include <gtest/gtest.h>

#include <memory>
#include <set>
#include <sstream>
#include <string>

#include "cardsim/card_engine.h"

namespace vqm::cardsim {
namespace {

// A submit PDU to "12345" with the 7-bit body "hello", no centre: 16 octets after the centre.
constexpr char kSubmit[] =
    "0011000581"
    "2143F5"
    "0000A7"
    "05"
    "E8329BFD06";
// A deliver PDU from "+4412" with "Hi", no centre.
constexpr char kDeliver[] =
    "00"
    "04"
    "0491"
    "4421"
    "0000"
    "20301141526300"
    "02C834";

class MessageMemoryTest : public ::testing::Test {
  protected:
    MessageMemoryTest() {
        auto set = std::make_unique<MessageMemory>();
        memory_ = set.get();
        engine_.AddCommandSet(std::move(set));
        Send("ATE0\r");
    }
    std::string Send(const std::string& text) {
        engine_.Feed(text.data(), text.size(), Clock::now());
        return engine_.TakeOutput();
    }
    std::string Write(const std::string& pdu, const std::string& stat = ",2") {
        const std::string prompt =
            Send("AT+CMGW=" + std::to_string(pdu.size() / 2 - 1) + stat + "\r");
        if (prompt != "\r\n> ") return prompt;
        return Send(pdu + "\x1A");
    }

    CardEngine engine_;
    MessageMemory* memory_ = nullptr;
};

TEST_F(MessageMemoryTest, StorageFormatAndErrors) {
    EXPECT_EQ(Send("AT+CPMS?\r"), "\r\n+CPMS: \"SM\",0,20,\"SM\",0,20,\"SM\",0,20\r\n\r\nOK\r\n");
    EXPECT_EQ(Send("AT+CPMS=\"SM\",\"SM\",\"SM\"\r"), "\r\n+CPMS: 0,20,0,20,0,20\r\n\r\nOK\r\n");
    EXPECT_EQ(Send("AT+CPMS=\"ME\"\r"), "\r\n+CMS ERROR: 302\r\n");
    EXPECT_EQ(Send("AT+CMGF?\r"), "\r\n+CMGF: 0\r\n\r\nOK\r\n");
    EXPECT_EQ(Send("AT+CMGF=2\r"), "\r\nERROR\r\n");

    EXPECT_EQ(Write(kSubmit), "\r\n+CMGW: 1\r\n\r\nOK\r\n");
    EXPECT_EQ(Send("AT+CMGR=1\r"),
              std::string("\r\n+CMGR: 2,,16\r\n") + kSubmit + "\r\n\r\nOK\r\n");
    EXPECT_EQ(Send("AT+CMGR=2\r"), "\r\n+CMS ERROR: 321\r\n");   // empty
    EXPECT_EQ(Send("AT+CMGD=21\r"), "\r\n+CMS ERROR: 321\r\n");  // beyond the SIM
    EXPECT_EQ(Send("AT+CMGD=2\r"), "\r\nOK\r\n");                // empty but there

    // The length must count the TPDU exactly, and the PDU must be whole hexadecimal.
    EXPECT_EQ(Send("AT+CMGW=17,2\r"), "\r\n> ");
    EXPECT_EQ(Send(std::string(kSubmit) + "\x1A"), "\r\n+CMS ERROR: 304\r\n");
    EXPECT_EQ(Write(std::string(kSubmit) + "0"), "\r\n+CMS ERROR: 304\r\n");
    EXPECT_EQ(Write(std::string(kSubmit).replace(10, 2, "ZZ")), "\r\n+CMS ERROR: 304\r\n");
    EXPECT_EQ(Write(kDeliver), "\r\n+CMS ERROR: 304\r\n");  // a deliver stored as unsent
    EXPECT_EQ(Write(kDeliver, ",1"), "\r\n+CMGW: 2\r\n\r\nOK\r\n");
    EXPECT_EQ(Send("AT+CMGW=0\r"), "\r\n+CMS ERROR: 304\r\n");

    // Sending needs a centre, from the PDU or the card; a received message is not sent.
    EXPECT_EQ(Send("AT+CMSS=1\r"), "\r\n+CMS ERROR: 330\r\n");
    EXPECT_EQ(Send("AT+CSCA=\"+4412\",145\r"), "\r\nOK\r\n");
    EXPECT_EQ(Send("AT+CSCA?\r"), "\r\n+CSCA: \"+4412\",145\r\n\r\nOK\r\n");
    // An empty number is the SIM's own centre again.
    EXPECT_EQ(Send("AT+CSCA=\"\"\r"), "\r\nOK\r\n");
    EXPECT_EQ(Send("AT+CSCA?\r"), "\r\n+CSCA: \"+3097100000\",145\r\n\r\nOK\r\n");
    EXPECT_EQ(Send("AT+CMSS=1\r"), "\r\n+CMSS: 0\r\n\r\nOK\r\n");
    EXPECT_EQ(Send("AT+CMSS=2\r"), "\r\n+CMS ERROR: 302\r\n");
    EXPECT_EQ(memory_->Messages().at(1).stat, MessageMemory::StoSent);
    EXPECT_EQ(Send("AT+CMGS=16\r"), "\r\n> ");
    EXPECT_EQ(Send(std::string(kSubmit) + "\x1A"), "\r\n+CMGS: 1\r\n\r\nOK\r\n");
    EXPECT_EQ(memory_->Messages().size(), 2u);  // sending stores nothing

    EXPECT_EQ(Send("AT+CSMP=17,,0\r"), "\r\nOK\r\n");  // a field left out keeps its value
    EXPECT_EQ(Send("AT+CSMP?\r"), "\r\n+CSMP: 17,167,0,0\r\n\r\nOK\r\n");
    EXPECT_EQ(Send("AT+CSMP=300\r"), "\r\nERROR\r\n");
}

TEST_F(MessageMemoryTest, FullMemoryAndCapacity) {
    EXPECT_EQ(memory_->Control("capacity", "2"), "OK");
    EXPECT_EQ(Write(kSubmit), "\r\n+CMGW: 1\r\n\r\nOK\r\n");
    EXPECT_EQ(memory_->Control("deliver-pdu", kDeliver), "OK");
    EXPECT_EQ(Send(""), "\r\n+CMTI: \"SM\",2\r\n");
    EXPECT_EQ(Send("AT+CMGW=16\r"), "\r\n+CMS ERROR: 322\r\n");  // refused before the prompt
    EXPECT_EQ(memory_->Control("deliver", "+4412 hello"), "ERROR: SIM message memory full");
    EXPECT_EQ(Send(""), "");  // nothing announced
    EXPECT_NE(memory_->Control("capacity", "1"), "OK");
    EXPECT_NE(memory_->Control("capacity", "0"), "OK");
    EXPECT_NE(memory_->Control("capacity", "x"), "OK");
    EXPECT_EQ(Send("AT+CMGD=1\r"), "\r\nOK\r\n");
    EXPECT_EQ(Send("AT+CPMS?\r"), "\r\n+CPMS: \"SM\",1,2,\"SM\",1,2,\"SM\",1,2\r\n\r\nOK\r\n");
    EXPECT_EQ(memory_->Control("deliver", "+4412 hello"), "OK");
    EXPECT_EQ(Send(""), "\r\n+CMTI: \"SM\",1\r\n");  // the first free location
}

TEST_F(MessageMemoryTest, ListingByStatusMarksUnreadAsRead) {
    ASSERT_EQ(memory_->Control("deliver-pdu", kDeliver), "OK");  // 1, unread
    ASSERT_EQ(memory_->Control("deliver-pdu", kDeliver), "OK");  // 2, unread
    EXPECT_EQ(Send(""), "\r\n+CMTI: \"SM\",1\r\n\r\n+CMTI: \"SM\",2\r\n");
    ASSERT_EQ(Write(kSubmit), "\r\n+CMGW: 3\r\n\r\nOK\r\n");
    const std::string entry1 = std::string("\r\n+CMGL: 1,0,,17\r\n") + kDeliver + "\r\n";
    const std::string entry2 = std::string("\r\n+CMGL: 2,0,,17\r\n") + kDeliver + "\r\n";
    EXPECT_EQ(Send("AT+CMGL=0\r"), entry1 + entry2 + "\r\nOK\r\n");
    EXPECT_EQ(Send("AT+CMGL=0\r"), "\r\nOK\r\n");  // both read now
    EXPECT_EQ(Send("AT+CMGL=1\r").find("+CMGL: 3"), std::string::npos);
    const std::string all = Send("AT+CMGL=4\r");
    EXPECT_NE(all.find("+CMGL: 1,1,,17"), std::string::npos);
    EXPECT_NE(all.find("+CMGL: 3,2,,16"), std::string::npos);
    EXPECT_EQ(Send("AT+CMGL=5\r"), "\r\n+CMS ERROR: 304\r\n");

    // Text mode names the status and shows the body as text.
    EXPECT_EQ(Send("AT+CMGF=1\r"), "\r\nOK\r\n");
    EXPECT_EQ(Send("AT+CMGL=\"STO UNSENT\"\r"),
              "\r\n+CMGL: 3,\"STO UNSENT\",\"12345\",\r\nhello\r\n\r\nOK\r\n");
    EXPECT_EQ(Send("AT+CMGR=1\r"),
              "\r\n+CMGR: \"REC READ\",\"+4412\",,\"02/03/11,14:25:36+00\"\r\nHi\r\n\r\nOK\r\n");
    EXPECT_EQ(Send("AT+CMGL=4\r"), "\r\n+CMS ERROR: 305\r\n");

    // <delflag> 1 removes the read ones, 3 the sent and unsent as well.
    EXPECT_EQ(Send("AT+CMGD=1,1\r"), "\r\nOK\r\n");
    EXPECT_EQ(memory_->Messages().size(), 1u);
    EXPECT_EQ(Send("AT+CMGD=1,3\r"), "\r\nOK\r\n");
    EXPECT_TRUE(memory_->Messages().empty());
}

TEST_F(MessageMemoryTest, TextModeWriteBuildsASubmit) {
    Send("AT+CMGF=1\r");
    EXPECT_EQ(Send("AT+CMGW=\"+4412\"\r"), "\r\n> ");
    EXPECT_EQ(Send("Hi\x1A"), "\r\n+CMGW: 1\r\n\r\nOK\r\n");
    EXPECT_EQ(memory_->Messages().at(1).pdu,
              "00110004914421"
              "0000A7"
              "02C834");
    EXPECT_EQ(Send("AT+CMGW=\"12a\"\r"), "\r\n+CMS ERROR: 305\r\n");
    EXPECT_EQ(Send("AT+CMGS=\"12345\",129\r"), "\r\n> ");
    EXPECT_EQ(Send("x\x1A"), "\r\n+CMS ERROR: 330\r\n");  // no centre yet
}

TEST_F(MessageMemoryTest, DeliveryChoosesTheAlphabet) {
    ASSERT_EQ(memory_->Control("deliver", "+306944123456 Hi @ 5"), "OK");
    const std::string gsm = memory_->Messages().at(1).pdu;
    // No centre: "00", then deliver, sender, 7-bit; the body behind the time stamp.
    EXPECT_EQ(gsm.substr(0, 22),
              "00040C91039644214365"
              "00");
    EXPECT_EQ(gsm.substr(22, 2), "00");
    EXPECT_EQ(gsm.substr(38, 2), "06");

    ASSERT_EQ(memory_->Control("deliver", "12345 Ωμέγα"), "OK");  // μ is not in the alphabet
    const std::string ucs2 = memory_->Messages().at(2).pdu;
    EXPECT_EQ(ucs2.substr(16, 2), "08");
    EXPECT_EQ(ucs2.substr(32), "0A03A903BC03AD03B303B1");

    EXPECT_EQ(memory_->Control("deliver", "+4412 " + std::string(160, 'a')), "OK");
    EXPECT_EQ(memory_->Messages().size(), 3u);
    // Longer texts arrive in parts behind a concatenation header (first octet 0x44).
    EXPECT_EQ(memory_->Control("deliver", "+4412 " + std::string(161, 'a')), "OK");
    std::string greek;
    for (int i = 0; i < 71; ++i)
        greek += "ω";
    EXPECT_EQ(memory_->Control("deliver", "+4412 " + greek), "OK");
    ASSERT_EQ(memory_->Messages().size(), 7u);
    EXPECT_EQ(memory_->Messages().at(4).pdu.substr(2, 2), "44");
    EXPECT_EQ(memory_->Messages().at(7).pdu.substr(32, 12), "050003020202");
    // A sender's name instead of a number: type 0xD0.
    EXPECT_EQ(memory_->Control("deliver", "MyBank hello"), "OK");
    EXPECT_EQ(memory_->Messages().at(8).pdu.substr(4, 4), "0BD0");
    EXPECT_NE(memory_->Control("deliver", "not-a-number hello"), "OK");
    EXPECT_NE(memory_->Control("deliver-pdu", kSubmit), "OK");
    EXPECT_EQ(memory_->Control("ring", "+4412"), "");  // not this group's
}

TEST_F(MessageMemoryTest, KeptStateComesBack) {
    memory_->FillDemo();
    ASSERT_EQ(Send("AT+CSMP=49,11\r"), "\r\nOK\r\n");
    ASSERT_EQ(memory_->Control("capacity", "30"), "OK");
    std::ostringstream saved;
    memory_->Save(saved);

    MessageMemory copy;
    std::istringstream lines(saved.str() + "sms 7 9 00ZZ\nsms 8 0 0004\n");
    std::string line;
    while (std::getline(lines, line)) {
        const size_t space = line.find(' ');
        EXPECT_TRUE(copy.Load(line.substr(0, space), line.substr(space + 1))) << line;
    }
    EXPECT_FALSE(copy.Load("firmware", "SW4.00"));
    EXPECT_EQ(copy.Capacity(), 30);
    EXPECT_EQ(copy.Centre(), memory_->Centre());
    ASSERT_EQ(copy.Messages().size(), memory_->Messages().size());  // damaged lines dropped
    for (const auto& [index, message] : memory_->Messages()) {
        EXPECT_EQ(copy.Messages().at(index).stat, message.stat);
        EXPECT_EQ(copy.Messages().at(index).pdu, message.pdu);
    }
    std::ostringstream again;
    copy.Save(again);
    EXPECT_EQ(again.str(), saved.str());
}

TEST_F(MessageMemoryTest, DemoSimHasVariedMessages) {
    memory_->FillDemo();
    ASSERT_GE(memory_->Messages().size(), 3u);
    EXPECT_FALSE(memory_->Centre().empty());
    Send("AT+CMGF=1\r");
    std::set<std::string> senders;
    int ucs2 = 0;
    for (const auto& [index, message] : memory_->Messages()) {
        const std::string reply = Send("AT+CMGR=" + std::to_string(index) + "\r");
        ASSERT_NE(reply.find("\r\nOK\r\n"), std::string::npos) << reply;
        const size_t number = reply.find("\",\"") + 3;
        senders.insert(reply.substr(number, reply.find('"', number) - number));
        if (message.pdu.find("0008") != std::string::npos) ++ucs2;
    }
    EXPECT_GE(ucs2, 1);
    EXPECT_EQ(senders.size(), memory_->Messages().size());
}

}  // namespace
}  // namespace vqm::cardsim
