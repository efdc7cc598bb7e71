// The desktop address book's vCard side, through EDS's own parser and writer: which vCard
// telephone types become which numbers, a folder of files good and bad, NUL bytes inside a card,
// ten thousand contacts, and phonebook entries out to vCards and back.
#include "contacts/address_book.h"

#include <gtest/gtest.h>

#include <cstdlib>
#include <cstring>
#include <filesystem>
#include <fstream>
#include <string>

#include "contacts/cache_builders.h"
#include "support/settings_store.h"
#include "support/text.h"
#include "tests/common/temp_folder.h"

namespace vqm {
namespace {

class AddressBookTest : public ::testing::Test {
  protected:
    void SetUp() override {
        // The library is one of the packages the build installs; without it nothing here runs.
        if (!ParseVCards("").opened) GTEST_SKIP() << kEbookContactsLibrary << " cannot be loaded";
    }
    void WriteFile(const std::string& name, const std::string& text) const {
        std::ofstream out(temp_ / name, std::ios::binary);
        out << text;
    }

    const testing::TempFolder temp_;
};

const char kTwoCards[] =
    "BEGIN:VCARD\r\nVERSION:3.0\r\nFN:Anna Berg\r\nN:Berg;Anna;;;\r\n"
    "TEL;TYPE=CELL:+49 171 5550101\r\nTEL;TYPE=HOME,VOICE:030 5550102\r\n"
    "TEL;TYPE=WORK,FAX:030 5550199\r\nEND:VCARD\r\n"
    "BEGIN:VCARD\r\nVERSION:2.1\r\nN:Ek;Olof\r\nFN:Olof Ek\r\nX-EVOLUTION-FILE-AS:Ek, Olof\r\n"
    "TEL;WORK;VOICE:+46 8 555 0103\r\nEND:VCARD\r\n";

TEST_F(AddressBookTest, TelephoneTypesBecomeTheCachedNumbers) {
    const AddressBookResult book = ParseVCards(kTwoCards);
    ASSERT_TRUE(book.opened);
    ASSERT_EQ(book.contacts.size(), 2u);
    const AddressBookContact& anna = book.contacts[0];
    EXPECT_EQ(anna.fileAs, u"Berg, Anna");  // no file-as: EDS files the contact by its name
    EXPECT_EQ(anna.mobile, u"+49 171 5550101");
    EXPECT_EQ(anna.home, u"030 5550102");
    EXPECT_EQ(anna.businessFax, u"030 5550199");
    EXPECT_TRUE(anna.business.empty());
    const AddressBookContact& olof = book.contacts[1];
    EXPECT_EQ(olof.fileAs, u"Ek, Olof");
    EXPECT_EQ(olof.business, u"+46 8 555 0103");
    EXPECT_TRUE(olof.mobile.empty());
}

TEST_F(AddressBookTest, AFolderOfFilesGoodAndBad) {
    WriteFile("a.vcf", kTwoCards);
    WriteFile("empty.vcf", "");
    std::string binary;
    for (int i = 0; i < 4096; ++i)
        binary += static_cast<char>((i * 7919) & 0xFF);
    WriteFile("binary.vcf", binary);
    WriteFile("cut.vcf", "BEGIN:VCARD\r\nVERSION:3.0\r\nFN:Cut Short\r\nTEL;TYPE=CELL:1");
    WriteFile("notes.txt", kTwoCards);  // not a vCard file by its name
    const AddressBookResult book = ReadVCardFolder(temp_.Path());
    ASSERT_TRUE(book.opened);
    EXPECT_EQ(book.source, AddressBookSource::VCardFolder);
    EXPECT_EQ(book.contacts.size(), 2u);

    const AddressBookResult none = ReadVCardFolder(temp_ / "no-such-folder");
    EXPECT_TRUE(none.opened);
    EXPECT_TRUE(none.contacts.empty());
}

// EDS reads each card as a C string. A NUL byte in a file used to end the card there, and where
// a quoted-printable '=' or an escape stood just before it, EDS's parser stepped past the end of
// its copy (the fuzz target's heap overflow); the card must reach EDS whole, up to END:VCARD.
TEST_F(AddressBookTest, ANulByteDoesNotCutACardShort) {
    using namespace std::string_literals;
    const struct {
        const char* name;
        std::string card;
        std::u16string mobile;
    } kCases[] = {
        {"after a name",
         "BEGIN:VCARD\r\nVERSION:3.0\r\nFN:Ann\0\r\nTEL;TYPE=CELL:+4471\r\nEND:VCARD\r\n"s,
         u"+4471"},
        {"behind a quoted-printable '='",
         "BEGIN:VCARD\r\nVERSION:2.1\r\nFN;ENCODING=QUOTED-PRINTABLE:Chlo=\0E9\r\n"
         "TEL;CELL:+4472\r\nEND:VCARD\r\n"s,
         u"+4472"},
        {"behind an escape and a folded line",
         "BEGIN:VCARD\r\nVERSION:3.0\r\nFN:Bo\\\r\n \0\r\nTEL;TYPE=CELL:+4473\r\nEND:VCARD\r\n"s,
         u"+4473"},
    };
    for (const auto& c : kCases) {
        const AddressBookResult book = ParseVCards(c.card);
        ASSERT_EQ(book.contacts.size(), 1u) << c.name;
        EXPECT_EQ(book.contacts[0].mobile, c.mobile) << c.name;
    }
}

TEST_F(AddressBookTest, TenThousandContactsAreAllRead) {
    std::string text;
    for (int i = 0; i < 10000; ++i)
        text += "BEGIN:VCARD\r\nVERSION:3.0\r\nFN:Person " + std::to_string(i) +
                "\r\nTEL;TYPE=CELL:+4917" + std::to_string(1000000 + i) + "\r\nEND:VCARD\r\n";
    WriteFile("many.vcf", text);
    const AddressBookResult book = ReadVCardFolder(temp_.Path());
    ASSERT_EQ(book.contacts.size(), 10000u);
    EXPECT_EQ(book.contacts[9999].fileAs, u"Person 9999");
    EXPECT_EQ(book.contacts[9999].mobile, u"+4917" + std::u16string(u"1009999"));
}

TEST_F(AddressBookTest, TheFolderSettingAndTheDefaultFolder) {
    SettingsStore settings(temp_ / "settings.db");
    const char* saved = std::getenv("XDG_DATA_HOME");
    const std::string restore = saved ? saved : "";
    setenv("XDG_DATA_HOME", temp_.Path().c_str(), 1);
    EXPECT_EQ(ContactsFolder(settings), temp_ / "VQMFull/contacts");
    SetSettingString(settings, kContactsFolderSetting, u"/elsewhere/cards");
    EXPECT_EQ(ContactsFolder(settings), "/elsewhere/cards");
    if (saved)
        setenv("XDG_DATA_HOME", restore.c_str(), 1);
    else
        unsetenv("XDG_DATA_HOME");

    // A named folder is read instead of EDS.
    std::filesystem::create_directories(temp_ / "mine");
    WriteFile("mine/x.vcf", kTwoCards);
    SetSettingString(settings, kContactsFolderSetting, Utf8ToUtf16(temp_ / "mine").c_str());
    const AddressBookResult book = ReadDesktopAddressBook(settings);
    EXPECT_EQ(book.source, AddressBookSource::VCardFolder);
    EXPECT_EQ(book.contacts.size(), 2u);
}

TEST_F(AddressBookTest, PhonebookEntriesOutToVCardsAndBack) {
    std::vector<PhonebookEntry> entries(3);
    std::memset(entries.data(), 0, entries.size() * sizeof(PhonebookEntry));
    auto fill = [](PhonebookEntry& e, int index, const char* number, const char* text) {
        e.index = index;
        std::strcpy(e.number, number);
        std::strcpy(e.text, text);
        e.numberLength = static_cast<int32_t>(std::strlen(number));
        e.textLength = static_cast<int32_t>(std::strlen(text));
    };
    fill(entries[0], 1, "+491715550101", "Anna");
    fill(entries[1], 2, "", "Empty slot");         // no number: not exported
    fill(entries[2], 7, "0305550102", "Caf\xE9");  // ISO 8859-1 on the card
    const std::string text = PhonebookToVCards(entries);
    EXPECT_NE(text.find("BEGIN:VCARD"), std::string::npos);
    const std::vector<VCardImportEntry> back = VCardsToPhonebook(ParseVCards(text));
    ASSERT_EQ(back.size(), 2u);
    EXPECT_EQ(back[0].name, u"Anna");
    EXPECT_EQ(back[0].number, u"+491715550101");
    EXPECT_EQ(back[1].name, u"Caf\u00E9");
    EXPECT_EQ(back[1].number, u"0305550102");
}

}  // namespace
}  // namespace vqm
