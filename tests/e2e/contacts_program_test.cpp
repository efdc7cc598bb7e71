// Contacts through the real programs: vqm-dialer against vqm-cardsim, the phonebook caches built
// at card-ready as the General page's settings ask, the address book read from a vCard folder,
// the Manage Contacts view's load when it is shown, and New, Edit, Copy To Card Phone and Delete
// driven through the dialer's socket, checked on the card and on the DialPad of a ring.
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

    // The simulated card's state file holds line within limit (or, with present false, no
    // longer holds it): each phonebook entry is a line "pb SM 9 145 +4930123 Name".
    bool CardHolds(const std::string& line, bool present = true) const {
        return WaitFor(
            [&] {
                return (Read(temp_ / "state/card.state").find(line) != std::string::npos) ==
                       present;
            },
            20s);
    }
    // The next New/Edit dialog is filled with name and number (no blanks in either).
    void NextDialog(const std::string& name, const std::string& number) const {
        std::ofstream(fields_) << "NEW_CONTACTS_DIALOG 1201=" << name << " 1202=" << number << "\n";
    }
    // A ring from number: the DialPad comes up with name, the caller gives up, and the pad is
    // idle again (the operator back on its status line, after the result's two seconds).
    void RingFrom(const std::string& number, const std::string& name) {
        const size_t named = Count("status " + name), unanswered = Count("status Unanswered"),
                     idle = Count("status COSMOTE");
        ASSERT_EQ(Ctl("ring " + number).second, 0);
        EXPECT_TRUE(LogShows("status " + name, 20s, named + 1)) << Log();
        EXPECT_EQ(Ctl("caller-hangup").second, 0);
        ASSERT_TRUE(LogShows("status Unanswered", 20s, unanswered + 1)) << Log();
        ASSERT_TRUE(LogShows("status COSMOTE", 20s, idle + 1)) << Log();
    }

    SettingsStore settings_{temp_ / "settings.db"};
    const std::string fields_ = temp_ / "dialog-fields";
};

// Command ids: the Manage Contacts view, and its menu.
constexpr int kShowContacts = 40004;
constexpr int kNew = 40021, kEdit = 40015, kCopyToCard = 40011, kDelete = 40013;

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

TEST_F(ContactsProgramTest, NewEditCopyAndDeleteReachTheCardAndNameACaller) {
    ASSERT_NO_FATAL_FAILURE(
        StartConnected("--powered", "--answer-boxes ok --dialog-fields " + fields_));
    EXPECT_EQ(Command(kShowContacts, 10000), 0L);
    ASSERT_TRUE(LogShows("contacts-list SIM Card: 8 rows", 60s)) << Log();
    EXPECT_EQ(Count("contacts-row SIM Card: "), 8u) << Log();
    EXPECT_TRUE(LogShows("contacts-row SIM Card: Alice Smith <+447700900123> SM 1")) << Log();
    ASSERT_TRUE(LogShows("contacts-list Card Phone: 3 rows")) << Log();
    // The limits are learnt from the card after the lists (the SIM's last).
    ASSERT_TRUE(WaitFor(
        [&] {
            int32_t total = 0;
            return GetSettingInt(settings_, u"sm_total", &total) && total == 250;
        },
        30s));

    // New: into the SIM's first free place, on the card and in the list.
    NextDialog("Zed", "+4930123");
    EXPECT_EQ(Command(kNew, 10000), 0L);
    EXPECT_TRUE(LogShows("dialog New Contacts: Name: | Number: -> OK")) << Log();
    EXPECT_TRUE(CardHolds("pb SM 9 145 +4930123 Zed\n")) << Log();
    EXPECT_TRUE(LogShows("contacts-row SIM Card: Zed <+4930123> SM 9")) << Log();
    EXPECT_TRUE(LogShows("contacts-list SIM Card: 9 rows")) << Log();
    // A call from the number just added rings with its name.
    ASSERT_NO_FATAL_FAILURE(RingFrom("+4930123", "Zed"));

    // Edit: the new contact is still the chosen row; it keeps its place.
    EXPECT_EQ(Command(kShowContacts, 10000), 0L);
    NextDialog("Zoe", "030123");
    EXPECT_EQ(Command(kEdit, 10000), 0L);
    EXPECT_TRUE(LogShows("dialog Edit Contacts: Name: | Number: -> OK")) << Log();
    EXPECT_TRUE(CardHolds("pb SM 9 129 030123 Zoe\n")) << Log();
    EXPECT_TRUE(CardHolds("+4930123", false)) << Log();
    EXPECT_TRUE(LogShows("contacts-row SIM Card: Zoe <030123> SM 9")) << Log();

    // Copy To Card Phone: behind the card memory's three.
    EXPECT_EQ(Command(kCopyToCard, 10000), 0L);
    EXPECT_TRUE(CardHolds("pb ME 4 129 030123 Zoe\n")) << Log();
    EXPECT_TRUE(LogShows("contacts-list Card Phone: 4 rows")) << Log();
    EXPECT_TRUE(LogShows("contacts-row Card Phone: Zoe <030123> ME 4")) << Log();

    // Delete: the SIM's entry goes; the copy stays, and still names the caller.
    EXPECT_EQ(Command(kDelete, 10000), 0L);
    EXPECT_TRUE(CardHolds("pb SM 9 ", false)) << Log();
    EXPECT_TRUE(CardHolds("pb ME 4 129 030123 Zoe\n")) << Log();
    EXPECT_TRUE(LogShows("contacts-list SIM Card: 8 rows", 20s, 2)) << Log();
    EXPECT_TRUE(CardHolds("pb SM 1 145 +447700900123 Alice Smith\n")) << Log();
    ASSERT_NO_FATAL_FAILURE(RingFrom("030123", "Zoe"));
    ExitDialer();
}

}  // namespace
}  // namespace vqm
