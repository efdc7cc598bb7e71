// Short messages end to end: vqm-dialer against vqm-cardsim, both started as a user starts
// them. A message the network delivers while the DialPad is in front is announced there; a tap
// on the notice (command 2002, what the desktop notification's action sends) opens the SMS
// Folder, which takes the message in. What the folder shows is read from the --ui-log record.
#include <gtest/gtest.h>

#include <chrono>
#include <cstdio>
#include <cstring>
#include <filesystem>
#include <fstream>
#include <string>

#include "contacts/phonebook_entry.h"
#include "tests/common/program_host.h"

namespace vqm {
namespace {

namespace fs = std::filesystem;
using namespace std::chrono_literals;
using testing::WaitFor;

class SmsProgramTest : public ::testing::Test, protected testing::ProgramHost {
  protected:
    SmsProgramTest() {
        // The SIM phonebook's cache knows one number.
        fs::create_directories(install_);
        PhonebookEntry entry{};
        entry.index = 1;
        entry.type = 145;
        std::snprintf(entry.number, sizeof entry.number, "+447700900123");
        std::snprintf(entry.text, sizeof entry.text, "Alice");
        entry.numberLength = static_cast<int32_t>(std::strlen(entry.number));
        entry.textLength = static_cast<int32_t>(std::strlen(entry.text));
        std::ofstream(install_ + "simphonebk1.db", std::ios::binary)
            .write(reinterpret_cast<const char*>(&entry), sizeof entry);
    }
    ~SmsProgramTest() override { ExitDialer(); }

    void Start() { StartConnected("--powered"); }
    // Taps the notice until the folder shows the line: a tap before the notice is up only
    // brings the DialPad forward.
    bool TapUntilShown(const std::string& line) {
        return WaitFor(
            [&] {
                Command(2002);
                return LogShows(line, 1500ms);
            },
            30s);
    }

    const std::string install_ = temp_ / "data/VQMFull/";
};

TEST_F(SmsProgramTest, DeliveredMessagesReachTheInboxThroughTheDialPadsNotice) {
    ASSERT_NO_FATAL_FAILURE(Start());
    ASSERT_EQ(Ctl("deliver +447700900123 Hello").second, 0);
    // Taken in on the tap, shown selected and still unread, under the name the SIM knows.
    ASSERT_TRUE(TapUntilShown("sms-shown Inbox: Alice | Hello | unread")) << Log();
    EXPECT_NE(Log().find("sms-folder Inbox="), std::string::npos);

    // Three parts of one long text show as one message; a named sender shows its name.
    std::string text;
    for (int i = 0; text.size() < 400; ++i)
        text += "part" + std::to_string(i) + "_";
    ASSERT_EQ(Ctl("deliver MyBank Your code is 1234").second, 0);
    ASSERT_EQ(Ctl("deliver +447700900123 " + text).second, 0);
    ASSERT_EQ(Command(40001), 0L);  // DialPad in front
    ASSERT_TRUE(TapUntilShown("sms-shown Inbox: Alice | " + text + " | unread")) << Log();
    EXPECT_TRUE(LogShows("sms-folder Inbox=6 ")) << Log();  // the demo's 3, Hello, bank, long
    EXPECT_EQ(Log().find("(part "), std::string::npos);     // no part missing
}

}  // namespace
}  // namespace vqm
