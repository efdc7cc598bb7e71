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

// Every place of both books takes a write, reads it back, and gives it up again; the places
// just outside the book are refused as a SIM refuses them.
TEST_F(CardPhonebooksTest, EveryPlaceWritesReadsAndDeletes) {
    struct Book {
        const char* name;
        int total;
    };
    for (const Book& book : {Book{"SM", 250}, Book{"ME", 100}}) {
        ASSERT_EQ(Send(std::string("AT+CPBS=\"") + book.name + "\""), "\r\nOK\r\n");
        Send("AT+CPBS?");
        for (int i = 1; i <= book.total; ++i) {
            const std::string index = std::to_string(i);
            ASSERT_EQ(Send("AT+CPBW=" + index + ",\"+" + index + "\",145,\"N" + index + "\""),
                      "\r\nOK\r\n")
                << book.name << i;
            ASSERT_EQ(Send("AT+CPBR=" + index), "\r\n+CPBR: " + index + ",\"+" + index +
                                                    "\",145,\"N" + index + "\"\r\n\r\nOK\r\n");
        }
        const std::string total = std::to_string(book.total);
        EXPECT_EQ(Send("AT+CPBS?"), "\r\n+CPBS: \"" + std::string(book.name) + "\"," + total + "," +
                                        total + "\r\n\r\nOK\r\n");
        // Full: a write without a place is the card's memory-full error; a named place is
        // overwritten.
        EXPECT_EQ(Send("AT+CPBW=,\"123\",129,\"Extra\""), "\r\nERROR\r\n");
        EXPECT_EQ(Send("AT+CPBW=" + total + ",\"9\",129,\"Last\""), "\r\nOK\r\n");
        for (const std::string& outside : {std::string("0"), std::to_string(book.total + 1)}) {
            EXPECT_EQ(Send("AT+CPBW=" + outside + ",\"1\",129,\"x\""), "\r\nERROR\r\n");
            EXPECT_EQ(Send("AT+CPBW=" + outside), "\r\nERROR\r\n");
            EXPECT_EQ(Send("AT+CPBR=" + outside), "\r\nERROR\r\n");
        }
        EXPECT_EQ(Send("AT+CPBR=1," + std::to_string(book.total + 1)), "\r\nERROR\r\n");
        for (int i = book.total; i >= 1; --i)
            ASSERT_EQ(Send("AT+CPBW=" + std::to_string(i)), "\r\nOK\r\n") << book.name << i;
        // Deleting an empty place is no error; reading an empty range lists nothing.
        EXPECT_EQ(Send("AT+CPBW=5"), "\r\nOK\r\n");
        EXPECT_EQ(Send("AT+CPBR=1," + total), "\r\nOK\r\n");
        EXPECT_EQ(Send("AT+CPBS?"),
                  "\r\n+CPBS: \"" + std::string(book.name) + "\",0," + total + "\r\n\r\nOK\r\n");
        // The first free place is the lowest one.
        Send("AT+CPBW=1,\"1\",129,\"a\"");
        Send("AT+CPBW=3,\"3\",129,\"c\"");
        EXPECT_EQ(Send("AT+CPBW=,\"2\",129,\"b\""), "\r\nOK\r\n");
        EXPECT_EQ(Send("AT+CPBR=2"), "\r\n+CPBR: 2,\"2\",129,\"b\"\r\n\r\nOK\r\n");
    }
}

}  // namespace
}  // namespace vqm::cardsim
