// The desktop address book, source of the "Outlook" contacts: Evolution Data Server's default
// address book, or a folder of vCard files where EDS is absent. Both go through EDS's own
// libraries, loaded when needed (dlopen) so that the dialer starts and works without them:
// libebook-1.2 talks to the EDS service, libebook-contacts-1.2 parses and writes vCards. No Qt.
#pragma once

#include <cstdint>
#include <string>
#include <vector>

#include "contacts/phonebook_entry.h"

namespace vqm {

class SettingsStore;

// The two libraries by the names the loader looks for.
inline constexpr char kEbookLibrary[] = "libebook-1.2.so.21";
inline constexpr char kEbookContactsLibrary[] = "libebook-contacts-1.2.so.4";
// The setting that names a vCard folder; when it is set, that folder is read instead of EDS.
inline constexpr char16_t kContactsFolderSetting[] = u"ContactsFolder";

// The fields of a contact that the caches keep, as the address book holds them.
struct AddressBookContact {
    std::u16string fileAs;
    std::u16string mobile;
    std::u16string home, home2, homeFax;
    std::u16string business, business2, businessFax;
};

enum class AddressBookSource { None, Eds, VCardFolder };

struct AddressBookResult {
    bool opened = false;  // the source could be read (an empty one counts)
    AddressBookSource source = AddressBookSource::None;
    std::string missingLibrary;  // set when the vCard library itself cannot be loaded
    std::vector<AddressBookContact> contacts;
};

// The default vCard folder: $XDG_DATA_HOME/VQMFull/contacts (~/.local/share/... without it).
std::string DefaultContactsFolder();
// The folder the dialer reads: the "ContactsFolder" setting, else the default.
std::string ContactsFolder(SettingsStore& settings);

// Reads the user's address book: the folder named by "ContactsFolder" when the setting is
// there; else EDS's default address book when libebook and a session bus with EDS are there;
// else the default vCard folder.
AddressBookResult ReadDesktopAddressBook(SettingsStore& settings);
// EDS's default address book only; opened is false when EDS cannot be reached.
AddressBookResult ReadEdsAddressBook();
// Every "*.vcf" file of folder (in name order), each holding any number of vCards. A missing
// folder is an address book with no contacts. Files that are empty, binary or damaged give
// what EDS's parser makes of them.
AddressBookResult ReadVCardFolder(const std::string& folder);
// The vCards of one text (a whole .vcf file).
AddressBookResult ParseVCards(const std::string& text);

// Phonebook entries as vCard 3.0 text (a name and one telephone number each), through EDS's
// own vCard writer. Empty when the library cannot be loaded (*missingLibrary says which).
std::string PhonebookToVCards(const std::vector<PhonebookEntry>& entries,
                              std::string* missingLibrary = nullptr);

// One phonebook entry a vCard gives for import: its name and its first number (mobile, then
// home, work and the others), already in the card's 8-bit form.
struct VCardImportEntry {
    std::u16string name;
    std::u16string number;
};
std::vector<VCardImportEntry> VCardsToPhonebook(const AddressBookResult& cards);

}  // namespace vqm
