// Short messages end to end: vqm-dialer against vqm-cardsim, both started as a user starts
// them. A message the network delivers while the DialPad is in front is announced there; a tap
// on the notice (command 2002, what the desktop notification's action sends) opens the SMS
// Folder, which takes the message in. What the folder shows is read from the --ui-log record.
#include <gtest/gtest.h>
#include <sys/stat.h>

#include <chrono>
#include <cstdio>
#include <cstring>
#include <filesystem>
#include <fstream>
#include <sstream>
#include <thread>

#include "contacts/phonebook_entry.h"
#include "support/local_socket.h"
#include "support/settings_store.h"
#include "tests/common/process.h"
#include "tests/common/temp_folder.h"

namespace vqm {
namespace {

namespace fs = std::filesystem;
using namespace std::chrono_literals;
using testing::Background;
using testing::RunShell;
using testing::WaitFor;

class SmsProgramTest : public ::testing::Test {
  protected:
    SmsProgramTest() {
        fs::create_directories(run_);
        chmod(run_.c_str(), 0700);
        SettingsStore settings(temp_ / "settings.db");
        SetSettingString(settings, u"PnpId", u"TAVRO_CARD_PHONE");
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
    ~SmsProgramTest() override {
        if (ServerAnswers(DialerSocket())) SendWindowMessage(DialerSocket(), 273, 40016, 0, 2000);
        dialer_.WaitExit(10s);
    }

    std::string Environment() const {
        return "env XDG_RUNTIME_DIR=" + temp_.Path() +
               "/xdg VQM_SETTINGS_DB=" + (temp_ / "settings.db") +
               " XDG_DATA_HOME=" + (temp_ / "data") +
               " QT_QPA_PLATFORM=offscreen DBUS_SESSION_BUS_ADDRESS=unix:path=/nonexistent ";
    }
    void Start() {
        card_.Start(Environment() + VQM_CARDSIM + " --powered --state-dir " + (temp_ / "state") +
                    " >" + (temp_ / "cardsim.out") + " 2>&1");
        ASSERT_TRUE(
            WaitFor([&] { return ServerAnswers(WindowSocketPath(run_, kCompanionClass)); }));
        dialer_.Start(Environment() + VQM_DIALER + " --ui-log " + (temp_ / "ui.log") +
                      " --answer-boxes ok >" + (temp_ / "dialer.out") + " 2>&1");
        ASSERT_TRUE(WaitFor([&] { return ServerAnswers(DialerSocket()); }, 10s));
        ASSERT_TRUE(LogShows("card 2 connected")) << Log();
    }
    std::string DialerSocket() const { return WindowSocketPath(run_, "DIALERAPP_CLASS"); }
    std::string Log() const {
        std::ifstream file(temp_ / "ui.log");
        std::ostringstream text;
        text << file.rdbuf();
        return text.str();
    }
    bool LogShows(const std::string& text, std::chrono::milliseconds limit = 20s) {
        return WaitFor([&] { return Log().find(text) != std::string::npos; }, limit);
    }
    std::pair<std::string, int> Ctl(const std::string& command) {
        return RunShell(Environment() + VQM_CARDSIM + " ctl " + command);
    }
    // Taps the notice until the folder shows the line: a tap before the notice is up only
    // brings the DialPad forward.
    bool TapUntilShown(const std::string& line) {
        return WaitFor(
            [&] {
                SendWindowMessage(DialerSocket(), 273, 2002, 0, 2000);
                return LogShows(line, 1500ms);
            },
            30s);
    }

    const testing::TempFolder temp_;
    const std::string run_ = temp_ / "xdg/VQMFull";
    const std::string install_ = temp_ / "data/VQMFull/";
    Background card_;
    Background dialer_;
};

TEST_F(SmsProgramTest, DeliveredMessagesReachTheInboxThroughTheDialPadsNotice) {
    Start();
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
    ASSERT_EQ(SendWindowMessage(DialerSocket(), 273, 40001, 0, 2000), 0L);  // DialPad in front
    ASSERT_TRUE(TapUntilShown("sms-shown Inbox: Alice | " + text + " | unread")) << Log();
    EXPECT_TRUE(LogShows("sms-folder Inbox=6 ")) << Log();  // the demo's 3, Hello, bank, long
    EXPECT_EQ(Log().find("(part "), std::string::npos);     // no part missing
}

}  // namespace
}  // namespace vqm
