// Contacts through the real programs: vqm-dialer against vqm-cardsim, the phonebook caches built
// at card-ready as the General page's settings ask, the address book read from a vCard folder,
// and the Manage Contacts view's load when it is shown.
#include <gtest/gtest.h>

#include <chrono>
#include <filesystem>
#include <fstream>
#include <string>

#include "support/settings_store.h"
#include "tests/common/program_host.h"

namespace vqm {
namespace {

namespace fs = std::filesystem;
using namespace std::chrono_literals;
using testing::WaitFor;

class ContactsProgramTest : public ::testing::Test, protected testing::ProgramHost {
  protected:
    ContactsProgramTest() {
        fs::create_directories(temp_ / "cards");
        const std::string cards = temp_ / "cards";
        SetSettingString(settings_, u"ContactsFolder",
                         std::u16string(cards.begin(), cards.end()).c_str());
    }
    void Start() { StartConnected("--powered"); }
    // Records in a cache file of the install folder, once its size has stayed put for a moment.
    size_t Records(const std::string& name, size_t size) const {
        std::error_code error;
        const auto bytes = fs::file_size(temp_ / ("data/VQMFull/" + name), error);
        return error ? 0 : bytes / size;
    }
    bool WaitRecords(const std::string& name, size_t size, size_t count) const {
        return WaitFor([&] { return Records(name, size) == count; }, 60s);
    }

    SettingsStore settings_{temp_ / "settings.db"};
};

TEST_F(ContactsProgramTest, CardReadyRebuildsTheCachesTheGeneralPageAsksFor) {
    const int32_t on = 1;
    SetSettingInt(settings_, u"GeneralRefreshSim", &on);
    SetSettingInt(settings_, u"GeneralRefreshOutlook", &on);
    std::ofstream(temp_ / "cards/friends.vcf")
        << "BEGIN:VCARD\r\nVERSION:3.0\r\nFN:Greta Holm\r\nTEL;TYPE=CELL:+46 70 555 01\r\n"
           "TEL;TYPE=WORK:08 555 03\r\nEND:VCARD\r\n";
    ASSERT_NO_FATAL_FAILURE(Start());
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
    ASSERT_NO_FATAL_FAILURE(Start());
    EXPECT_EQ(Records("simphonebk1.db", 80), 0u);  // nothing asked for at card-ready
    EXPECT_EQ(Command(40004, 10000), 0L);
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
