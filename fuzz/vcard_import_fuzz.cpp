// Feeds arbitrary text to the vCard import: the program's cut into cards and EDS's own parser
// (libebook-contacts, loaded at run time) behind ParseVCards, then what each caller makes of the
// contacts: the import's phonebook entries as Manage Contacts and vqm-phone build them, and the
// address-book cache's records for a vCard folder. The text is handed over as a file's bytes are.
#include <cstdint>
#include <cstring>
#include <string>

#include "contacts/address_book.h"
#include "contacts/cache_builders.h"
#include "messaging/sms_at.h"
#include "support/numbers.h"
#include "support/text.h"
#include "tools/phone_commands.h"

namespace {

void CheckField(const char* field, size_t size, int length) {
    if (length < 0 || static_cast<size_t>(length) >= size || field[length] != '\0')
        __builtin_trap();
}

// Manage Contacts: dialable characters of the number, both cut to 32, then the 8-bit entry.
void AsManageContacts(const vqm::VCardImportEntry& entry) {
    char16_t digits[256];
    const int count = vqm::CopyNumberText(entry.number.c_str(), digits, 256);
    if (count < 0 || count > 255 || digits[count] != u'\0') __builtin_trap();
    const std::u16string name = entry.name.substr(0, 32);
    const std::u16string number = std::u16string(digits).substr(0, 32);
    vqm::IsEnglishText(name.c_str(), name.size() * 2);
    vqm::PhonebookEntry out{};
    out.numberLength = vqm::WideToNarrow(number.c_str(), out.number,
                                         static_cast<int>(number.size()), sizeof out.number);
    out.textLength =
        vqm::WideToNarrow(name.c_str(), out.text, static_cast<int>(name.size()), sizeof out.text);
    CheckField(out.number, sizeof out.number, out.numberLength);
    CheckField(out.text, sizeof out.text, out.textLength);
}

// vqm-phone: the number as a recipient's, the name through the 8-bit table.
void AsPhoneCommand(const vqm::VCardImportEntry& entry) {
    const std::string number = vqm::phone::RecipientNumber(vqm::Utf16ToUtf8(entry.number));
    if (number.size() >= sizeof(vqm::SmsRecord::number)) __builtin_trap();
    std::string name;
    for (char16_t c : entry.name)
        name += vqm::LatinOrQuestionMark(c);
    if (name.size() != entry.name.size()) __builtin_trap();
}

}  // namespace

// GLib keeps allocations across calls (quarks, type data, and a GString that EDS 3.46's parser
// leaks on some damaged cards), so nearly every input would look leaky and stop for a full leak
// scan. The leak check is left to the address-book tests, which run the same calls under LSan.
extern "C" const char* __asan_default_options() {
    return "detect_leaks=0";
}

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
    const std::string text(reinterpret_cast<const char*>(data), size);
    const vqm::AddressBookResult cards = vqm::ParseVCards(text);
    if (!cards.opened) __builtin_trap();  // the library is there in the fuzz build
    for (const vqm::AddressBookContact& contact : cards.contacts) {
        const vqm::OutlookRecords records = vqm::MakeOutlookRecords(contact);
        if (!std::memchr(records.mobile.name, 0, sizeof records.mobile.name)) __builtin_trap();
        CheckField(records.mobile.number, sizeof records.mobile.number, records.mobileLength);
        for (int i = 0; i < 3; ++i) {
            CheckField(records.home.numbers[i], sizeof records.home.numbers[i],
                       records.homeLengths[i]);
            CheckField(records.work.numbers[i], sizeof records.work.numbers[i],
                       records.workLengths[i]);
        }
    }
    for (const vqm::VCardImportEntry& entry : vqm::VCardsToPhonebook(cards)) {
        if (entry.number.empty()) __builtin_trap();  // a card without a number gives no entry
        AsManageContacts(entry);
        AsPhoneCommand(entry);
    }
    return 0;
}
