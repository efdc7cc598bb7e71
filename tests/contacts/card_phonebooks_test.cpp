// The simulated card's phonebooks on the bare engine: names in each character set a client
// may select, and quoted fields that hold the separators of the command line.
#include "cardsim/phonebooks.h"

#include <gtest/gtest.h>

#include <memory>
#include <string>

#include "cardsim/card_engine.h"

namespace vqm::cardsim {
namespace {

class CardPhonebooksTest : public ::testing::Test {
  protected:
    CardPhonebooksTest() {
        auto set = std::make_unique<Phonebooks>();
        books_ = set.get();
        engine_.AddCommandSet(std::move(set));
        Send("ATE0");
    }
    std::string Send(const std::string& line) {
        const std::string bytes = line + "\r";
        engine_.Feed(bytes.data(), bytes.size(), Clock::now());
        return engine_.TakeOutput();
    }
    const Phonebooks::Entry* Stored(int index) {
        const Phonebooks::Book* sim = books_->Find("SM");
        auto it = sim->entries.find(index);
        return it == sim->entries.end() ? nullptr : &it->second;
    }

    CardEngine engine_;
    Phonebooks* books_ = nullptr;
};

TEST_F(CardPhonebooksTest, NamesTravelInTheSelectedCharacterSet) {
    EXPECT_EQ(Send("AT+CPBW=1,\"+447700900789\",145,\"Chlo\xE9\""), "\r\nOK\r\n");
    EXPECT_EQ(Send("AT+CPBR=1"), "\r\n+CPBR: 1,\"+447700900789\",145,\"Chlo\xE9\"\r\n\r\nOK\r\n");

    ASSERT_EQ(Send("AT+CSCS=\"UCS2\""), "\r\nOK\r\n");
    EXPECT_EQ(Send("AT+CPBR=1"),
              "\r\n+CPBR: 1,\"+447700900789\",145,\"00430068006C006F00E9\"\r\n\r\nOK\r\n");
    // A name beyond ISO 8859-1 is kept with '?' for what the card cannot store; a number may
    // come encoded too.
    EXPECT_EQ(Send("AT+CPBW=2,\"0030003100320033\",129,\"00410142\""), "\r\nOK\r\n");
    ASSERT_NE(Stored(2), nullptr);
    EXPECT_EQ(Stored(2)->number, "0123");
    EXPECT_EQ(Stored(2)->text, "A?");
    EXPECT_NE(Send("AT+CPBW=3,\"0123\",129,\"00E\""), "\r\nOK\r\n");  // not whole units

    ASSERT_EQ(Send("AT+CSCS=\"GSM\""), "\r\nOK\r\n");
    // e-acute is code 0x05 in the default alphabet; '@' is code 0x00.
    EXPECT_EQ(Send("AT+CPBR=1"), "\r\n+CPBR: 1,\"+447700900789\",145,\"Chlo\x05\"\r\n\r\nOK\r\n");
    EXPECT_EQ(Send("AT+CPBW=4,\"0123\",129,\"a" + std::string(1, '\0') + "b\x04\""), "\r\nOK\r\n");
    EXPECT_EQ(Stored(4)->text, "a@b\xE8");

    ASSERT_EQ(Send("AT+CSCS=\"IRA\""), "\r\nOK\r\n");
    EXPECT_EQ(Send("AT+CPBR=1"), "\r\n+CPBR: 1,\"+447700900789\",145,\"Chlo?\"\r\n\r\nOK\r\n");
    EXPECT_NE(Send("AT+CPBW=5,\"0123\",129,\"\xE9\""), "\r\nOK\r\n");
    EXPECT_EQ(Stored(5), nullptr);

    EXPECT_EQ(Send("AT+CSCS=\"UTF-8\""), "\r\nERROR\r\n");
    EXPECT_EQ(Send("AT+CPBR=1"), "\r\n+CPBR: 1,\"+447700900789\",145,\"Chlo?\"\r\n\r\nOK\r\n");
}

TEST_F(CardPhonebooksTest, QuotedCommasAndMalformedWritesChangeNothing) {
    EXPECT_EQ(Send("AT+CPBW=7,\"0123\",129,\"Smith, John\""), "\r\nOK\r\n");
    ASSERT_NE(Stored(7), nullptr);
    EXPECT_EQ(Stored(7)->text, "Smith, John");
    const unsigned long revision = engine_.Revision();
    for (const char* bad : {
             "AT+CPBW=8,0123,129,\"x\"",          // number not quoted
             "AT+CPBW=8,\"0123\",\"129\",\"x\"",  // type quoted
             "AT+CPBW=8,\"0123\",129,\"x",        // name never closed
             "AT+CPBW=8,\"0123\",100,\"x\"",      // not a type of address
             "AT+CPBW=8,\"0123\",129,\"x\",1",    // a field too many
             "AT+CPBW=\"8\",\"0123\"",            // index quoted
             "AT+CPBW=8,\"\",129,\"x\"",          // no number
         }) {
        EXPECT_EQ(Send(bad), "\r\nERROR\r\n") << bad;
    }
    EXPECT_EQ(Stored(8), nullptr);
    EXPECT_EQ(engine_.Revision(), revision);  // nothing to save
    // A delete is a change to keep.
    EXPECT_EQ(Send("AT+CPBW=7"), "\r\nOK\r\n");
    EXPECT_GT(engine_.Revision(), revision);
}

}  // namespace
}  // namespace vqm::cardsim
