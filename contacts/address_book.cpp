#include "contacts/address_book.h"

#include <dlfcn.h>

#include <algorithm>
#include <cstdlib>
#include <cstring>
#include <filesystem>
#include <fstream>
#include <mutex>
#include <sstream>

#include "support/settings_store.h"
#include "support/text.h"

namespace vqm {

namespace {

// GLib and EDS types as the loaded functions see them: only pointers and the two plain
// structs whose layout GLib keeps stable.
struct GSList {
    void* data;
    GSList* next;
};
struct GError {
    uint32_t domain;
    int code;
    char* message;
};

// EDS's vCard functions, looked up once. The libraries stay loaded: GLib types registered by
// them cannot be unloaded safely.
struct VCardApi {
    bool loaded = false;
    void* (*contactNewFromVcard)(const char*) = nullptr;
    void* (*contactNew)() = nullptr;
    int (*fieldId)(const char*) = nullptr;
    const void* (*getConst)(void*, int) = nullptr;
    void (*set)(void*, int, const void*) = nullptr;
    char* (*toString)(void*, int) = nullptr;
    void (*objectUnref)(void*) = nullptr;
    void (*free)(void*) = nullptr;
    // Field ids by their EDS names, looked up so that no header of EDS is needed to build.
    int fileAs = 0, fullName = 0, nickname = 0, org = 0, mobile = 0, home = 0, home2 = 0,
        homeFax = 0, business = 0, business2 = 0, businessFax = 0, other = 0;
};

struct EbookApi {
    bool loaded = false;
    void* (*registryNewSync)(void*, GError**) = nullptr;
    void* (*refDefaultAddressBook)(void*) = nullptr;
    void* (*connectSync)(void*, uint32_t, void*, GError**) = nullptr;
    int (*getContactsSync)(void*, const char*, GSList**, void*, GError**) = nullptr;
    void (*slistFreeFull)(GSList*, void (*)(void*)) = nullptr;
    void (*errorFree)(GError*) = nullptr;
};

template <typename F>
bool Look(void* handle, const char* name, F*& out) {
    out = reinterpret_cast<F*>(dlsym(handle, name));
    return out != nullptr;
}

const VCardApi& VCard() {
    static VCardApi api;
    static std::once_flag once;
    std::call_once(once, [] {
        void* handle = dlopen(kEbookContactsLibrary, RTLD_NOW | RTLD_GLOBAL);
        if (!handle) return;
        void* gobject = dlopen("libgobject-2.0.so.0", RTLD_NOW | RTLD_GLOBAL);
        bool ok = gobject && Look(handle, "e_contact_new_from_vcard", api.contactNewFromVcard) &&
                  Look(handle, "e_contact_new", api.contactNew) &&
                  Look(handle, "e_contact_field_id", api.fieldId) &&
                  Look(handle, "e_contact_get_const", api.getConst) &&
                  Look(handle, "e_contact_set", api.set) &&
                  Look(handle, "e_vcard_to_string", api.toString) &&
                  Look(gobject, "g_object_unref", api.objectUnref) &&
                  Look(gobject, "g_free", api.free);
        if (!ok) return;
        api.fileAs = api.fieldId("file_as");
        api.fullName = api.fieldId("full_name");
        api.nickname = api.fieldId("nickname");
        api.org = api.fieldId("org");
        api.mobile = api.fieldId("mobile_phone");
        api.home = api.fieldId("home_phone");
        api.home2 = api.fieldId("home_phone_2");
        api.homeFax = api.fieldId("home_fax");
        api.business = api.fieldId("business_phone");
        api.business2 = api.fieldId("business_phone_2");
        api.businessFax = api.fieldId("business_fax");
        api.other = api.fieldId("other_phone");
        api.loaded = api.fileAs > 0 && api.mobile > 0 && api.businessFax > 0;
    });
    return api;
}

const EbookApi& Ebook() {
    static EbookApi api;
    static std::once_flag once;
    std::call_once(once, [] {
        if (!VCard().loaded) return;
        void* handle = dlopen(kEbookLibrary, RTLD_NOW | RTLD_GLOBAL);
        void* glib = dlopen("libglib-2.0.so.0", RTLD_NOW | RTLD_GLOBAL);
        if (!handle || !glib) return;
        // libedataserver comes with libebook; dlsym on the handle searches its dependencies.
        api.loaded =
            Look(handle, "e_source_registry_new_sync", api.registryNewSync) &&
            Look(handle, "e_source_registry_ref_default_address_book", api.refDefaultAddressBook) &&
            Look(handle, "e_book_client_connect_sync", api.connectSync) &&
            Look(handle, "e_book_client_get_contacts_sync", api.getContactsSync) &&
            Look(glib, "g_slist_free_full", api.slistFreeFull) &&
            Look(glib, "g_error_free", api.errorFree);
    });
    return api;
}

std::u16string Field(const VCardApi& api, void* contact, int field) {
    if (field <= 0) return {};
    const char* text = static_cast<const char*>(api.getConst(contact, field));
    return text ? Utf8ToUtf16(text) : std::u16string();
}

AddressBookContact FromEContact(const VCardApi& api, void* contact) {
    AddressBookContact c;
    c.fileAs = Field(api, contact, api.fileAs);
    // A vCard from elsewhere rarely has EDS's file-as; the name a person gave comes next.
    for (int fallback : {api.fullName, api.nickname}) {
        if (!c.fileAs.empty()) break;
        c.fileAs = Field(api, contact, fallback);
    }
    c.mobile = Field(api, contact, api.mobile);
    c.home = Field(api, contact, api.home);
    c.home2 = Field(api, contact, api.home2);
    c.homeFax = Field(api, contact, api.homeFax);
    c.business = Field(api, contact, api.business);
    c.business2 = Field(api, contact, api.business2);
    c.businessFax = Field(api, contact, api.businessFax);
    return c;
}

std::string Trimmed(const std::string& line) {
    size_t begin = 0, end = line.size();
    while (begin < end && (line[begin] == ' ' || line[begin] == '\t'))
        ++begin;
    while (end > begin && (line[end - 1] == '\r' || line[end - 1] == ' ' || line[end - 1] == '\t'))
        --end;
    std::string out = line.substr(begin, end - begin);
    std::transform(out.begin(), out.end(), out.begin(),
                   [](unsigned char ch) { return static_cast<char>(std::toupper(ch)); });
    return out;
}

// A .vcf file holds one vCard after another; EDS parses one at a time, so the text is cut at
// the BEGIN/END lines (nested cards, as vCard 2.1 agents, stay inside theirs).
std::vector<std::string> SplitCards(const std::string& text) {
    std::vector<std::string> cards;
    std::istringstream in(text);
    std::string line, card;
    int depth = 0;
    while (std::getline(in, line)) {
        const std::string key = Trimmed(line);
        if (key == "BEGIN:VCARD") ++depth;
        if (depth > 0) card += line + "\n";
        if (key == "END:VCARD" && depth > 0 && --depth == 0) {
            cards.push_back(std::move(card));
            card.clear();
        }
    }
    return cards;
}

AddressBookResult MissingVCardLibrary() {
    AddressBookResult result;
    result.missingLibrary = kEbookContactsLibrary;
    return result;
}

}  // namespace

std::string DefaultContactsFolder() {
    const char* data = std::getenv("XDG_DATA_HOME");
    std::string base;
    if (data && data[0] == '/') {
        base = data;
    } else {
        const char* home = std::getenv("HOME");
        base = std::string(home ? home : "") + "/.local/share";
    }
    return base + "/VQMFull/contacts";
}

std::string ContactsFolder(SettingsStore& settings) {
    char16_t folder[kMaxSettingLength + 1];
    if (GetSettingString(settings, kContactsFolderSetting, folder, kMaxSettingLength + 1) &&
        folder[0] != u'\0')
        return Utf16ToUtf8(folder);
    return DefaultContactsFolder();
}

AddressBookResult ParseVCards(const std::string& text) {
    const VCardApi& api = VCard();
    if (!api.loaded) return MissingVCardLibrary();
    AddressBookResult result;
    result.opened = true;
    result.source = AddressBookSource::VCardFolder;
    for (std::string& card : SplitCards(text)) {
        // EDS takes the card as a C string: a NUL byte would end it early, and a quoted-printable
        // '=' or an escape just before that end sends EDS's parser past its copy of the card.
        card.erase(std::remove(card.begin(), card.end(), '\0'), card.end());
        void* contact = api.contactNewFromVcard(card.c_str());
        if (!contact) continue;
        result.contacts.push_back(FromEContact(api, contact));
        api.objectUnref(contact);
    }
    return result;
}

AddressBookResult ReadVCardFolder(const std::string& folder) {
    if (!VCard().loaded) return MissingVCardLibrary();
    AddressBookResult result;
    result.opened = true;
    result.source = AddressBookSource::VCardFolder;
    std::error_code error;
    std::vector<std::filesystem::path> files;
    for (const auto& item : std::filesystem::directory_iterator(folder, error)) {
        std::string extension = item.path().extension().string();
        std::transform(extension.begin(), extension.end(), extension.begin(),
                       [](unsigned char ch) { return static_cast<char>(std::tolower(ch)); });
        if (extension == ".vcf" && item.is_regular_file(error)) files.push_back(item.path());
    }
    std::sort(files.begin(), files.end());
    for (const auto& path : files) {
        std::ifstream in(path, std::ios::binary);
        std::ostringstream text;
        text << in.rdbuf();
        AddressBookResult one = ParseVCards(text.str());
        for (AddressBookContact& contact : one.contacts)
            result.contacts.push_back(std::move(contact));
    }
    return result;
}

AddressBookResult ReadEdsAddressBook() {
    AddressBookResult result;
    const char* bus = std::getenv("DBUS_SESSION_BUS_ADDRESS");
    // Without a session bus GLib would try to launch one; EDS is simply not there.
    if (!bus || !bus[0]) return result;
    const VCardApi& vcard = VCard();
    const EbookApi& api = Ebook();
    if (!vcard.loaded || !api.loaded) return result;
    GError* error = nullptr;
    void* registry = api.registryNewSync(nullptr, &error);
    if (!registry) {
        if (error) api.errorFree(error);
        return result;
    }
    void* source = api.refDefaultAddressBook(registry);
    // A local address book never reports itself "connected", so the connect waits out its
    // limit whatever it is (0 waits for good): one second, after which it is ready anyway.
    void* client = source ? api.connectSync(source, 1, nullptr, &error) : nullptr;
    if (error) {
        api.errorFree(error);
        error = nullptr;
    }
    GSList* list = nullptr;
    // EDS's query for every contact.
    if (client && api.getContactsSync(client, "(contains \"x-evolution-any-field\" \"\")", &list,
                                      nullptr, &error)) {
        result.opened = true;
        result.source = AddressBookSource::Eds;
        for (GSList* item = list; item; item = item->next)
            if (item->data) result.contacts.push_back(FromEContact(vcard, item->data));
    }
    if (error) api.errorFree(error);
    if (list) api.slistFreeFull(list, vcard.objectUnref);
    if (client) vcard.objectUnref(client);
    if (source) vcard.objectUnref(source);
    vcard.objectUnref(registry);
    return result;
}

AddressBookResult ReadDesktopAddressBook(SettingsStore& settings) {
    char16_t folder[kMaxSettingLength + 1];
    if (GetSettingString(settings, kContactsFolderSetting, folder, kMaxSettingLength + 1) &&
        folder[0] != u'\0')
        return ReadVCardFolder(Utf16ToUtf8(folder));
    AddressBookResult eds = ReadEdsAddressBook();
    if (eds.opened) return eds;
    return ReadVCardFolder(DefaultContactsFolder());
}

std::string PhonebookToVCards(const std::vector<PhonebookEntry>& entries,
                              std::string* missingLibrary) {
    const VCardApi& api = VCard();
    if (!api.loaded) {
        if (missingLibrary) *missingLibrary = kEbookContactsLibrary;
        return {};
    }
    std::string out;
    for (const PhonebookEntry& entry : entries) {
        if (entry.numberLength <= 0) continue;
        char16_t name[kPhonebookTextSize + 1];
        char16_t number[kPhonebookNumberSize + 1];
        NarrowToWide(entry.text, name, std::clamp<int>(entry.textLength, 0, kPhonebookTextSize),
                     sizeof name / 2);
        NarrowToWide(entry.number, number,
                     std::clamp<int>(entry.numberLength, 0, kPhonebookNumberSize),
                     sizeof number / 2);
        const std::string nameText = Utf16ToUtf8(name), numberText = Utf16ToUtf8(number);
        void* contact = api.contactNew();
        if (!contact) continue;
        api.set(contact, api.fullName, nameText.c_str());
        api.set(contact, api.fileAs, nameText.c_str());
        api.set(contact, api.mobile, numberText.c_str());
        char* text = api.toString(contact, 1);  // vCard 3.0
        if (text) {
            out += text;
            out += "\r\n";
            api.free(text);
        }
        api.objectUnref(contact);
    }
    return out;
}

std::vector<VCardImportEntry> VCardsToPhonebook(const AddressBookResult& cards) {
    std::vector<VCardImportEntry> out;
    for (const AddressBookContact& c : cards.contacts) {
        for (const std::u16string* number : {&c.mobile, &c.home, &c.business, &c.home2,
                                             &c.business2, &c.homeFax, &c.businessFax}) {
            if (number->empty()) continue;
            out.push_back({c.fileAs, *number});
            break;
        }
    }
    return out;
}

}  // namespace vqm
