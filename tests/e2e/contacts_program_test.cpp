// Contacts through the real programs: vqm-dialer against vqm-cardsim, the phonebook caches built
// at card-ready as the General page's settings ask, the address book read from a vCard folder,
// and the Manage Contacts view's load when it is shown.
#include <gtest/gtest.h>
#include <sys/stat.h>

#include <chrono>
#include <filesystem>
#include <fstream>
#include <sstream>

#include "support/local_socket.h"
#include "support/settings_store.h"
#include "tests/common/process.h"
#include "tests/common/temp_folder.h"

namespace vqm {
namespace {

namespace fs = std::filesystem;
using namespace std::chrono_literals;
using testing::Background;
using testing::WaitFor;

class ContactsProgramTest : public ::testing::Test {
  protected:
    ContactsProgramTest() {
        fs::create_directories(temp_ / "xdg/VQMFull");
        chmod((temp_ / "xdg/VQMFull").c_str(), 0700);
        fs::create_directories(temp_ / "cards");
        SetSettingString(settings_, u"PnpId", u"TAVRO_CARD_PHONE");
        const std::string cards = temp_ / "cards";
        SetSettingString(settings_, u"ContactsFolder",
                         std::u16string(cards.begin(), cards.end()).c_str());
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
        const std::string run = temp_ / "xdg/VQMFull";
        ASSERT_TRUE(WaitFor([&] { return ServerAnswers(WindowSocketPath(run, kCompanionClass)); }));
        dialer_.Start(Environment() + VQM_DIALER + " --ui-log " + (temp_ / "ui.log") +
                      " --answer-boxes ok >" + (temp_ / "dialer.out") + " 2>&1");
        ASSERT_TRUE(
            WaitFor([&] { return Log().find("card 2 connected") != std::string::npos; }, 30s))
            << Log();
    }
    std::string Log() const {
        std::ifstream file(temp_ / "ui.log");
        std::ostringstream text;
        text << file.rdbuf();
        return text.str();
    }
    // Records in a cache file of the install folder, once its size has stayed put for a moment.
    size_t Records(const std::string& name, size_t size) const {
        std::error_code error;
        const auto bytes = fs::file_size(temp_ / ("data/VQMFull/" + name), error);
        return error ? 0 : bytes / size;
    }
    bool WaitRecords(const std::string& name, size_t size, size_t count) const {
        return WaitFor([&] { return Records(name, size) == count; }, 60s);
    }

    const testing::TempFolder temp_;
    SettingsStore settings_{temp_ / "settings.db"};
    Background card_;
    Background dialer_;
};

TEST_F(ContactsProgramTest, CardReadyRebuildsTheCachesTheGeneralPageAsksFor) {
    const int32_t on = 1;
    SetSettingInt(settings_, u"GeneralRefreshSim", &on);
    SetSettingInt(settings_, u"GeneralRefreshOutlook", &on);
    std::ofstream(temp_ / "cards/friends.vcf")
        << "BEGIN:VCARD\r\nVERSION:3.0\r\nFN:Greta Holm\r\nTEL;TYPE=CELL:+46 70 555 01\r\n"
           "TEL;TYPE=WORK:08 555 03\r\nEND:VCARD\r\n";
    Start();
    // The demo SIM has eight contacts and the demo card memory its own.
    EXPECT_TRUE(WaitRecords("simphonebk1.db", 80, 8)) << Records("simphonebk1.db", 80);
    EXPECT_TRUE(WaitRecords("phonebk1.db", 160, 1));
    EXPECT_TRUE(WaitRecords("phonebk3.db", 224, 1));
    EXPECT_EQ(Records("phonebk2.db", 224), 0u);
    // The learnt geometry is written once the SIM build has reported.
    EXPECT_TRUE(WaitFor(
        [&] {
            int32_t total = 0;
            return GetSettingInt(settings_, u"sm_total", &total) && total == 250;
        },
        30s));
    dialer_.Stop();
}

TEST_F(ContactsProgramTest, ShowingManageContactsLoadsTheSimCache) {
    Start();
    EXPECT_EQ(Records("simphonebk1.db", 80), 0u);  // nothing asked for at card-ready
    const std::string socket = WindowSocketPath(temp_ / "xdg/VQMFull", "DIALERAPP_CLASS");
    EXPECT_EQ(SendWindowMessage(socket, 273, 40004, 0), 0L);
    EXPECT_TRUE(WaitRecords("simphonebk1.db", 80, 8));
    EXPECT_TRUE(WaitFor(
        [&] {
            int32_t total = 0;
            return GetSettingInt(settings_, u"me_total", &total) && total == 100;
        },
        30s));
    // The address-book cache lives only from a rebuild: showing the view cleared it.
    EXPECT_EQ(Records("phonebk1.db", 160), 0u);
    dialer_.Stop();
}

}  // namespace
}  // namespace vqm
