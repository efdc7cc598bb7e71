// The desktop address book read from a private Evolution Data Server: contacts are added to the
// default address book through EDS's own client library, as a user's address-book program adds
// them, and the dialer reads them back and builds its caches from them. Run inside a private
// session bus by eds_address_book_test.sh; skipped where EDS itself is not installed.
#include <dlfcn.h>
#include <gtest/gtest.h>

#include <cstdint>
#include <string>

#include "contacts/address_book.h"
#include "contacts/cache_builders.h"
#include "support/settings_store.h"
#include "tests/common/temp_folder.h"

namespace vqm {
namespace {

struct GError {
    uint32_t domain;
    int code;
    char* message;
};

// Adds vCards to EDS's default address book; "" when done, else what failed.
std::string AddToEds(const std::vector<std::string>& cards) {
    void* ebook = dlopen(kEbookLibrary, RTLD_NOW | RTLD_GLOBAL);
    if (!ebook) return "no libebook";
    auto registryNew =
        reinterpret_cast<void* (*)(void*, GError**)>(dlsym(ebook, "e_source_registry_new_sync"));
    auto refDefault = reinterpret_cast<void* (*)(void*)>(
        dlsym(ebook, "e_source_registry_ref_default_address_book"));
    auto connect = reinterpret_cast<void* (*)(void*, uint32_t, void*, GError**)>(
        dlsym(ebook, "e_book_client_connect_sync"));
    auto add = reinterpret_cast<int (*)(void*, void*, int, char**, void*, GError**)>(
        dlsym(ebook, "e_book_client_add_contact_sync"));
    auto fromVcard =
        reinterpret_cast<void* (*)(const char*)>(dlsym(ebook, "e_contact_new_from_vcard"));
    auto unref = reinterpret_cast<void (*)(void*)>(dlsym(ebook, "g_object_unref"));
    if (!registryNew || !refDefault || !connect || !add || !fromVcard || !unref)
        return "missing symbol";
    GError* error = nullptr;
    void* registry = registryNew(nullptr, &error);
    if (!registry) return error ? error->message : "no registry";
    void* source = refDefault(registry);
    if (!source) return "no default address book";
    void* client = connect(source, 1, nullptr, &error);
    if (!client) return error ? error->message : "no client";
    std::string result;
    for (const std::string& card : cards) {
        void* contact = fromVcard(card.c_str());
        const bool added = add(client, contact, 0, nullptr, nullptr, &error);
        unref(contact);
        if (!added) {
            result = error ? error->message : "add failed";
            break;
        }
    }
    unref(client);
    unref(source);
    unref(registry);
    return result;
}

TEST(EdsAddressBookTest, ContactsAddedToEdsReachTheCaches) {
    if (!dlopen(kEbookLibrary, RTLD_NOW | RTLD_GLOBAL)) GTEST_SKIP() << kEbookLibrary;
    ASSERT_EQ(AddToEds({"BEGIN:VCARD\r\nVERSION:3.0\r\nFN:Greta Holm\r\nN:Holm;Greta;;;\r\n"
                        "TEL;TYPE=CELL:+46 70 555 01\r\nTEL;TYPE=HOME:08 555 02\r\nEND:VCARD",
                        "BEGIN:VCARD\r\nVERSION:3.0\r\nFN:Ivo Work\r\n"
                        "TEL;TYPE=WORK,VOICE:08 555 03\r\nEND:VCARD"}),
              "");
    const AddressBookResult book = ReadEdsAddressBook();
    ASSERT_TRUE(book.opened);
    EXPECT_EQ(book.source, AddressBookSource::Eds);
    ASSERT_EQ(book.contacts.size(), 2u);

    // Without a folder setting, the desktop's address book is EDS's.
    const testing::TempFolder temp;
    SettingsStore settings(temp / "settings.db");
    SetSettingString(settings, u"InstallPath",
                     std::u16string(temp.Path().begin(), temp.Path().end()).c_str());
    PhonebookCaches caches(settings);
    OutlookCacheBuild(caches, [&] { return ReadDesktopAddressBook(settings); }, {}, {});
    char16_t name[140];
    ASSERT_EQ(FindNameByNumber(caches, "+467055501", name, 140), 1);
    EXPECT_EQ(std::u16string(name), u"Holm, Greta");
    ASSERT_EQ(FindNameByNumber(caches, "0855503", name, 140), 1);
    EXPECT_EQ(std::u16string(name), u"Ivo Work");
}

}  // namespace
}  // namespace vqm
