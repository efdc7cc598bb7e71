// The one reading of AT parameters that every part of the simulated card shares.
#include "cardsim/arguments.h"

#include <gtest/gtest.h>

#include <memory>
#include <string>
#include <vector>

#include "cardsim/card_engine.h"
#include "cardsim/network_services.h"
#include "cardsim/phonebooks.h"

namespace vqm::cardsim {
namespace {

TEST(Arguments, SplitRules) {
    struct Case {
        const char* text;
        bool ok;
        std::vector<Argument> fields;  // text, quoted, present
    };
    const Case cases[] = {
        {"", true, {{"", false, false}}},
        {"1", true, {{"1", false, true}}},
        {"1,,3", true, {{"1", false, true}, {"", false, false}, {"3", false, true}}},
        {" 1 , 2 ", true, {{"1", false, true}, {"2", false, true}}},
        {"\"a,b;c\",2", true, {{"a,b;c", true, true}, {"2", false, true}}},
        {"\"Mary Ann\"", true, {{"Mary Ann", true, true}}},
        {"\"\",", true, {{"", true, true}, {"", false, false}}},
        {" \"x\" ,1", true, {{"x", true, true}, {"1", false, true}}},
        {"\"abc", false, {}},   // unclosed
        {"1,\"", false, {}},    // unclosed, empty
        {"\"a\"b", false, {}},  // text after the closing quote
        {"a\"b\"", false, {}},  // a quote after the field's text
        {"\"a\"\"b\"", false, {}},
    };
    for (const Case& c : cases) {
        std::vector<Argument> fields = {{"stale", true, true}};
        EXPECT_EQ(SplitArguments(c.text, &fields), c.ok) << c.text;
        ASSERT_EQ(fields.size(), c.fields.size()) << c.text;
        for (size_t i = 0; i < fields.size(); ++i) {
            EXPECT_EQ(fields[i].text, c.fields[i].text) << c.text << " #" << i;
            EXPECT_EQ(fields[i].quoted, c.fields[i].quoted) << c.text << " #" << i;
            EXPECT_EQ(fields[i].present, c.fields[i].present) << c.text << " #" << i;
        }
    }
}

TEST(Arguments, CommandsEndAtASemicolonOutsideQuotes) {
    const std::string line = "+CSCS=\"IRA;\";+CPBW=1,\"1\",129,\"a;b\";+CSQ";
    const size_t first = CommandEnd(line, 0);
    EXPECT_EQ(line.substr(0, first), "+CSCS=\"IRA;\"");
    const size_t second = CommandEnd(line, first + 1);
    EXPECT_EQ(line.substr(first + 1, second - first - 1), "+CPBW=1,\"1\",129,\"a;b\"");
    EXPECT_EQ(CommandEnd(line, second + 1), line.size());
}

// Every group reads its parameters the same way: the engine refuses a command whose
// parameters do not split before any group sees it, and a quoted ',' or ';' is text.
TEST(Arguments, EveryGroupFollowsTheSameRule) {
    CardEngine engine;
    engine.AddCommandSet(std::make_unique<NetworkServices>());
    engine.AddCommandSet(std::make_unique<Phonebooks>());
    const auto now = Clock::time_point{} + std::chrono::hours(1);
    auto send = [&](const std::string& text) {
        engine.Feed(text.data(), text.size(), now);
        return engine.TakeOutput();
    };
    send("ATE0\r");
    struct Case {
        const char* command;
        const char* reply;
    };
    const Case cases[] = {
        {"AT+CLCK=\"SC\",2\r", "\r\n+CLCK: 0\r\n\r\nOK\r\n"},
        {"AT+CLCK=\"SC,2\r", "\r\nERROR\r\n"},
        {"AT+CLCK=\"SC\"x,2\r", "\r\nERROR\r\n"},
        {"AT+CPBS=\"SM\"\r", "\r\nOK\r\n"},
        {"AT+CPBW=7,\"0123\",129,\"Smith, J; Jr\"\r", "\r\nOK\r\n"},
        {"AT+CPBR=7\r", "\r\n+CPBR: 7,\"0123\",129,\"Smith, J; Jr\"\r\n\r\nOK\r\n"},
        {"AT+CPBW=8,\"0123\",129,\"Bob\r", "\r\nERROR\r\n"},
        {"AT+CPBR=8\r", "\r\nOK\r\n"},  // nothing was written
        {"AT+CSCS=\"GSM\r", "\r\nERROR\r\n"},
        {"AT+CLVL=\"5\"\r", "\r\nERROR\r\n"},
    };
    for (const Case& c : cases)
        EXPECT_EQ(send(c.command), c.reply) << c.command;
}

}  // namespace
}  // namespace vqm::cardsim
