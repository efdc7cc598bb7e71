#include "tools/phone_commands.h"

#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <chrono>
#include <cstdio>
#include <cstring>
#include <filesystem>
#include <fstream>
#include <memory>
#include <sstream>

#include "calls/call_log.h"
#include "contacts/address_book.h"
#include "contacts/phonebook_at.h"
#include "contacts/phonebook_cache.h"
#include "link/device_at.h"
#include "link/link.h"
#include "link/voice_at.h"
#include "messaging/message_store.h"
#include "messaging/sms_at.h"
#include "messaging/sms_folder.h"
#include "messaging/write_sms.h"
#include "support/gsm.h"
#include "support/local_socket.h"
#include "support/settings_store.h"
#include "support/text.h"

namespace vqm::phone {
namespace {

namespace fs = std::filesystem;

constexpr size_t kFeedKeep = 200;

Result Fail(int code, const std::string& text) {
    return Result{code, "", text + "\n"};
}

// ---- text helpers ----

std::string Latin1ToUtf8(const char* text, size_t size) {
    std::u16string wide;
    for (size_t i = 0; i < size && text[i]; ++i)
        wide.push_back(LatinToWide(text[i]));
    return Utf16ToUtf8(wide);
}

std::string WideToUtf8(const char16_t* text) {
    return Utf16ToUtf8(std::u16string(text, WideLength(text, 4096)));
}

std::string Json(const std::string& text) {
    std::string out = "\"";
    for (unsigned char c : text) {
        switch (c) {
            case '"':
                out += "\\\"";
                break;
            case '\\':
                out += "\\\\";
                break;
            case '\n':
                out += "\\n";
                break;
            case '\r':
                out += "\\r";
                break;
            case '\t':
                out += "\\t";
                break;
            default:
                if (c < 0x20) {
                    char code[8];
                    std::snprintf(code, sizeof code, "\\u%04x", c);
                    out += code;
                } else {
                    out += static_cast<char>(c);
                }
        }
    }
    return out + "\"";
}

// One JSON object from name/value pairs whose values are already JSON.
std::string JsonObject(const std::vector<std::pair<std::string, std::string>>& fields) {
    std::string out = "{";
    for (size_t i = 0; i < fields.size(); ++i)
        out += (i ? "," : "") + Json(fields[i].first) + ":" + fields[i].second;
    return out + "}";
}

std::string JsonArray(const std::vector<std::string>& items) {
    std::string out = "[";
    for (size_t i = 0; i < items.size(); ++i)
        out += (i ? "," : "") + items[i];
    return out + "]";
}

bool AllDigits(const std::string& text) {
    return !text.empty() && text.size() < 10 &&
           std::all_of(text.begin(), text.end(), [](char c) { return c >= '0' && c <= '9'; });
}

// ---- command line ----

struct PageName {
    const char* name;
    int page;
};
constexpr PageName kPages[] = {{"inbox", kPageInbox},
                               {"outbox", kPageOutbox},
                               {"sent", kPageSent},
                               {"draft", kPageDraft},
                               {"pc", kPagePda}};

const char* PageNameOf(int page) {
    for (const PageName& p : kPages)
        if (p.page == page) return p.name;
    return "inbox";
}

struct LogName {
    const char* name;
    int log;
};
constexpr LogName kLogs[] = {
    {"answered", kCallLogAnswered}, {"dialed", kCallLogDialed}, {"unanswered", kCallLogUnanswered}};

const char* LogNameOf(int log) {
    for (const LogName& l : kLogs)
        if (l.log == log) return l.name;
    return "";
}

// Options anywhere after the verb; what is left are the operands.
struct Split {
    std::vector<std::string> operands;
    std::vector<std::pair<std::string, std::string>> options;  // name, value ("" for flags)
};

bool SplitArguments(const std::vector<std::string>& args, size_t from,
                    const std::vector<std::string>& valued, Split* split, std::string* error) {
    for (size_t i = from; i < args.size(); ++i) {
        const std::string& a = args[i];
        if (a.size() > 2 && a.compare(0, 2, "--") == 0) {
            if (std::find(valued.begin(), valued.end(), a) != valued.end()) {
                if (i + 1 >= args.size()) {
                    *error = a + " needs a value";
                    return false;
                }
                split->options.emplace_back(a, args[++i]);
            } else {
                split->options.emplace_back(a, "");
            }
        } else {
            split->operands.push_back(a);
        }
    }
    return true;
}

bool OnlyOptions(const Split& split, const std::vector<std::string>& allowed, std::string* error) {
    for (const auto& option : split.options)
        if (std::find(allowed.begin(), allowed.end(), option.first) == allowed.end()) {
            *error = "unknown option " + option.first;
            return false;
        }
    return true;
}

bool ReadBook(const Split& split, bool desktopAllowed, Book* book, std::string* error) {
    for (const auto& option : split.options) {
        Book chosen = option.first == "--sim"       ? Book::Sim
                      : option.first == "--card"    ? Book::Card
                      : option.first == "--desktop" ? Book::Desktop
                                                    : Book::All;
        if (chosen == Book::All) continue;
        if (chosen == Book::Desktop && !desktopAllowed) {
            *error = "--desktop is not a phonebook on the card";
            return false;
        }
        if (*book != Book::All && *book != chosen) {
            *error =
                "choose one of --sim, --card" + std::string(desktopAllowed ? ", --desktop" : "");
            return false;
        }
        *book = chosen;
    }
    return true;
}

// ---- escaping for the socket ----

std::string Escape(const std::string& text) {
    std::string out = ":";
    for (char c : text) {
        switch (c) {
            case '\\':
                out += "\\\\";
                break;
            case ' ':
                out += "\\s";
                break;
            case '\n':
                out += "\\n";
                break;
            case '\r':
                out += "\\r";
                break;
            case '\t':
                out += "\\t";
                break;
            default:
                out += c;
        }
    }
    return out;
}

bool Unescape(const std::string& field, std::string* out) {
    if (field.empty() || field[0] != ':') return false;
    out->clear();
    for (size_t i = 1; i < field.size(); ++i) {
        if (field[i] != '\\') {
            out->push_back(field[i]);
            continue;
        }
        if (++i >= field.size()) return false;
        switch (field[i]) {
            case '\\':
                out->push_back('\\');
                break;
            case 's':
                out->push_back(' ');
                break;
            case 'n':
                out->push_back('\n');
                break;
            case 'r':
                out->push_back('\r');
                break;
            case 't':
                out->push_back('\t');
                break;
            default:
                return false;
        }
    }
    return true;
}

std::vector<std::string> Fields(const std::string& line) {
    std::vector<std::string> fields;
    std::istringstream in(line);
    std::string field;
    while (in >> field)
        fields.push_back(field);
    return fields;
}

// ---- the card's phonebooks ----

constexpr int kRun = 10;

// Every used entry of a storage; false when the card did not answer or refused the storage.
bool ReadStorage(Link& link, int storage, std::vector<PhonebookEntry>* entries, int32_t* total) {
    if (PhonebookSelect(link, storage) != 0) return false;
    int32_t used = 0;
    *total = 0;
    if (!PhonebookGetUsage(link, &used, total)) return false;
    const size_t before = entries->size();
    // Once every used place was found the rest are empty: a mostly empty SIM is read quickly.
    for (int first = 1; first <= *total && static_cast<int>(entries->size() - before) < used;
         first += kRun) {
        const int last = std::min(first + kRun - 1, static_cast<int>(*total));
        PhonebookEntry run[kRun];
        std::memset(run, 0, sizeof run);
        if (!PhonebookReadRange(link, first, last, run)) return false;
        for (int i = 0; i <= last - first; ++i)
            if (run[i].numberLength > 0) entries->push_back(run[i]);
    }
    return true;
}

const char* BookName(int storage) {
    return storage == kStorageSimCard ? "sim" : "card";
}

// ---- the commands ----

std::string PowerText(long state) {
    switch (state) {
        case 0:
            return "down";
        case 1:
            return "ready";
        case 2:
            return "powering up";
        default:
            return "unknown";
    }
}

Result Status(Context& context, bool json) {
    char16_t manufacturer[64] = {}, model[64] = {}, firmware[64] = {}, operatorName[64] = {};
    if (!GetCardIdentity(context.link, manufacturer, 64, model, 64, firmware, 64))
        return Fail(kExitRefused, "The card did not answer.");
    // Asked in turn: the dialer's own polls hold the port often.
    const int bars = GetSignalBarsInTurn(context.link);
    const bool haveOperator = GetOperatorName(context.link, operatorName, 64);
    long power = -1;
    if (!context.companionPath.empty())
        if (auto answer = SendWindowMessage(context.companionPath, kMsgCardPowerQuery, 0, 0, 2000))
            power = *answer;
    const std::string card = WideToUtf8(manufacturer) + " " + WideToUtf8(model);
    const std::string op = haveOperator ? WideToUtf8(operatorName) : "";
    char version[32];
    std::snprintf(version, sizeof version, "%.2f", context.link.firmwareVersion);
    Result result;
    if (json) {
        result.out = JsonObject({{"card", Json(card)},
                                 {"manufacturer", Json(WideToUtf8(manufacturer))},
                                 {"model", Json(WideToUtf8(model))},
                                 {"power", Json(PowerText(power))},
                                 {"operator", Json(op)},
                                 {"signal", std::to_string(bars)},
                                 {"firmware", Json(WideToUtf8(firmware))},
                                 {"firmwareVersion", version}}) +
                     "\n";
    } else {
        result.out = "Card:     " + card + "\nPower:    " + PowerText(power) +
                     "\nOperator: " + (op.empty() ? "(none)" : op) + "\nSignal:   " +
                     (bars < 0 ? std::string("unknown") : std::to_string(bars) + "/4") +
                     "\nFirmware: " + WideToUtf8(firmware) + "\n";
    }
    return result;
}

std::string CallText(int result) {
    switch (result) {
        case 0:
            return "Voice call";
        case 7:
            return "Number is busy";
        case 8:
            return "Number not answer";
        default:
            return "Call could not be established";
    }
}

Result Dial(Context& context, const Command& command, CallLog& log) {
    AddDialedCall(log, command.number.c_str());
    std::atomic<int> cancel{0};
    const int code = DialExchange(context.link, command.number.c_str(), cancel);
    if (code != 0 && code != 7 && code != 8) HangUp(context.link);  // as the DialPad does
    if (context.listsChanged) context.listsChanged();
    Result result;
    result.code = code == 0 ? kExitDone : kExitRefused;
    const std::string text = CallText(code);
    if (command.json)
        result.out = JsonObject({{"number", Json(command.number)},
                                 {"result", std::to_string(code)},
                                 {"text", Json(text)}}) +
                     "\n";
    else if (code == 0)
        result.out = text + "\n";
    else
        result.err = text + "\n";
    return result;
}

Result Simple(bool ok, bool json, const std::string& done, const std::string& failed) {
    Result result;
    result.code = ok ? kExitDone : kExitRefused;
    if (json)
        result.out =
            JsonObject({{"ok", ok ? "true" : "false"}, {"text", Json(ok ? done : failed)}}) + "\n";
    else if (ok)
        result.out = done + "\n";
    else
        result.err = failed + "\n";
    return result;
}

// The message folders as the SMS Folder view fills them, with the SIM read afresh.
struct Folders {
    Folders(Context& context, const Command& command) : store(context.settings) {
        StoreGuardCreate(store);
        // The SIM cache is read afresh, as the SMS Folder view does when it is shown; the
        // computer's own pages need no card.
        if (NeedsCard(command)) {
            std::remove(StoreFolderPath(store, kFolderSim).c_str());
            StoreRefreshSim(store, context.link);
        }
        NameLookup names = [&context](const char* number) -> std::u16string {
            if (!context.caches) return {};
            char16_t name[64] = {};
            if (!FindNameByNumber(*context.caches, number, name, 64)) return {};
            return name;
        };
        FillFolderPages(store, names, {}, &listing);
    }
    const FolderRow* Find(int page, int index) const {
        for (const FolderRow& row : listing.pages[page])
            if (row.record.index == index ||
                std::find(row.parts.begin(), row.parts.end(), index) != row.parts.end())
                return &row;
        return nullptr;
    }
    MessageStore store;
    FolderListing listing;
};

std::string RowJson(int page, const FolderRow& row, bool withBody) {
    std::vector<std::pair<std::string, std::string>> fields = {
        {"folder", Json(PageNameOf(page))},
        {"index", std::to_string(row.record.index)},
        {"memory", Json(row.folder == kFolderSim ? "sim" : "pc")},
        {"number", Json(Latin1ToUtf8(row.record.number, sizeof row.record.number))},
        {"from", Json(Utf16ToUtf8(row.from))},
        {"date", Json(Utf16ToUtf8(row.date))},
        {"unread", row.unread ? "true" : "false"},
        {"ucs2", row.record.coding == 8 ? "true" : "false"}};
    fields.emplace_back(withBody ? "text" : "preview",
                        Json(Utf16ToUtf8(withBody ? row.body : row.preview)));
    return JsonObject(fields);
}

Result SmsList(Context& context, const Command& command) {
    Folders folders(context, command);
    Result result;
    const auto& rows = folders.listing.pages[command.page];
    if (command.json) {
        std::vector<std::string> items;
        for (const FolderRow& row : rows)
            items.push_back(RowJson(command.page, row, false));
        result.out = JsonArray(items) + "\n";
        return result;
    }
    for (const FolderRow& row : rows) {
        char head[64];
        std::snprintf(head, sizeof head, "%4d %c ", row.record.index, row.unread ? '*' : ' ');
        result.out += head + Utf16ToUtf8(row.date) + "  " + Utf16ToUtf8(row.from) + "  " +
                      Utf16ToUtf8(row.preview) + "\n";
    }
    if (rows.empty())
        result.out = std::string("No messages in ") + PageNameOf(command.page) + ".\n";
    return result;
}

Result SmsRead(Context& context, const Command& command) {
    Folders folders(context, command);
    const FolderRow* row = folders.Find(command.page, command.index);
    if (!row)
        return Fail(kExitUsage, "No message " + std::to_string(command.index) + " in " +
                                    PageNameOf(command.page) + ".");
    if (row->unread) OpenMessage(folders.store, *row);
    Result result;
    if (command.json)
        result.out = RowJson(command.page, *row, true) + "\n";
    else
        result.out = "From: " + Utf16ToUtf8(row->from) + "\nDate: " + Utf16ToUtf8(row->date) +
                     "\n\n" + Utf16ToUtf8(row->body) + "\n";
    return result;
}

Result SmsDelete(Context& context, const Command& command) {
    Folders folders(context, command);
    const FolderRow* row = folders.Find(command.page, command.index);
    if (!row)
        return Fail(kExitUsage, "No message " + std::to_string(command.index) + " in " +
                                    PageNameOf(command.page) + ".");
    std::string box;
    FolderUi ui;
    ui.box = [&box](const std::u16string& text, const std::u16string&) { box = Utf16ToUtf8(text); };
    std::function<void()> cleared = [&context] {
        if (!context.companionPath.empty())
            SendWindowMessage(context.companionPath, kMsgSimFullCleared, 0, 0, 2000);
    };
    const bool ok = DeleteMessages(folders.store, context.link, {*row}, ui, cleared) == 1;
    if (context.listsChanged) context.listsChanged();
    return Simple(ok, command.json, "Message deleted.",
                  box.empty() ? "Cannot delete message." : box);
}

// The Write SMS view's send: its body, its walk over the recipients and its texts; each
// message the card took is filed on the Sent page through the transfer file, as the view does.
Result SmsSendAll(Context& context, const Command& command) {
    SmsRecord body{};
    std::string error;
    if (CheckMessageText(command.text, &body, &error) != kExitDone) return Fail(kExitUsage, error);
    ParsedRecipients recipients;
    for (const std::string& given : command.numbers) {
        std::string number = RecipientNumber(given);
        if (number.empty()) return Fail(kExitUsage, "Not a phone number: \"" + given + "\".");
        recipients.numbers.push_back(std::move(number));
        ++recipients.count;
    }
    MessageStore store(context.settings);
    StoreGuardCreate(store);
    FolderUi ui;
    store.hooks.pasteInto = [&](int page) { PasteIntoPage(store, context.link, page, ui); };
    std::vector<std::string> sent;
    SendHooks hooks;
    hooks.sent = [&](const SmsRecord& record) {
        ClipboardCopyRecord(store, record);
        sent.emplace_back(record.number, strnlen(record.number, sizeof record.number));
    };
    const SendOutcome outcome = SendToRecipients(context.link, body, recipients, hooks);
    if (!sent.empty() && context.listsChanged) context.listsChanged();

    Result result;
    const std::string said = Utf16ToUtf8(SendEndBox(outcome).text);
    if (outcome.end == SendEnd::Sent) {
        if (!command.json) result.out = said + "\n";
    } else {
        result.code = kExitRefused;
        result.err = (said.empty() ? std::string("Failed to send message.") : said) + "\n";
    }
    if (command.json) {
        std::vector<std::string> items;
        for (const std::string& number : sent)
            items.push_back(Json(number));
        result.out = JsonObject({{"sent", JsonArray(items)},
                                 {"coding", Json(body.coding == 8 ? "ucs2" : "gsm")},
                                 {"ok", result.code == kExitDone ? "true" : "false"}}) +
                     "\n";
    }
    return result;
}

std::string ContactJson(const std::string& book, int index, const std::string& name,
                        const std::string& number) {
    return JsonObject({{"book", Json(book)},
                       {"index", std::to_string(index)},
                       {"name", Json(name)},
                       {"number", Json(number)}});
}

Result ContactsList(Context& context, const Command& command) {
    std::vector<std::string> items;
    std::string text;
    for (int storage : {kStorageSimCard, kStorageCardPhone}) {
        if (command.book == Book::Desktop) break;
        if (command.book == Book::Sim && storage != kStorageSimCard) continue;
        if (command.book == Book::Card && storage != kStorageCardPhone) continue;
        std::vector<PhonebookEntry> entries;
        int32_t total = 0;
        if (!ReadStorage(context.link, storage, &entries, &total))
            return Fail(kExitRefused, std::string("Cannot read the ") +
                                          (storage == kStorageSimCard ? "SIM" : "card") +
                                          " phonebook.");
        for (const PhonebookEntry& entry : entries) {
            const std::string name = Latin1ToUtf8(entry.text, sizeof entry.text);
            const std::string number = Latin1ToUtf8(entry.number, sizeof entry.number);
            items.push_back(ContactJson(BookName(storage), entry.index, name, number));
            char head[32];
            std::snprintf(head, sizeof head, "%-5s %4d  ", BookName(storage), entry.index);
            text += head + name + "  " + number + "\n";
        }
    }
    if (command.book == Book::All || command.book == Book::Desktop) {
        AddressBookResult book = ReadDesktopAddressBook(context.settings);
        int index = 0;
        for (const AddressBookContact& contact : book.contacts) {
            ++index;
            const std::u16string* number = &contact.mobile;
            for (const std::u16string* other :
                 {&contact.mobile, &contact.home, &contact.business, &contact.home2,
                  &contact.business2, &contact.homeFax, &contact.businessFax})
                if (number->empty()) number = other;
            const std::string name = Utf16ToUtf8(contact.fileAs);
            items.push_back(ContactJson("desktop", index, name, Utf16ToUtf8(*number)));
            char head[32];
            std::snprintf(head, sizeof head, "%-7s %4d  ", "desktop", index);
            text += head + name + "  " + Utf16ToUtf8(*number) + "\n";
        }
    }
    Result result;
    result.out = command.json ? JsonArray(items) + "\n" : text;
    return result;
}

// Writes a file whole or not at all: a flushed temporary copy renamed over it.
bool WriteWhole(const std::string& path, const std::string& text) {
    const std::string temporary = path + ".tmp";
    FILE* file = std::fopen(temporary.c_str(), "wb");
    if (!file) return false;
    bool ok = std::fwrite(text.data(), 1, text.size(), file) == text.size();
    ok = std::fflush(file) == 0 && ok;
    ok = fsync(fileno(file)) == 0 && ok;
    ok = std::fclose(file) == 0 && ok;
    if (ok) ok = std::rename(temporary.c_str(), path.c_str()) == 0;
    if (!ok) std::remove(temporary.c_str());
    return ok;
}

Result ContactsExport(Context& context, const Command& command) {
    std::vector<PhonebookEntry> entries;
    for (int storage : {kStorageSimCard, kStorageCardPhone}) {
        if (command.book == Book::Sim && storage != kStorageSimCard) continue;
        if (command.book == Book::Card && storage != kStorageCardPhone) continue;
        int32_t total = 0;
        if (!ReadStorage(context.link, storage, &entries, &total))
            return Fail(kExitRefused, "Cannot read the card's phonebooks.");
    }
    std::string missing;
    const std::string cards = PhonebookToVCards(entries, &missing);
    if (cards.empty() && !entries.empty())
        return Fail(kExitRefused, "Cannot write vCards: " + missing + " is missing.");
    if (!WriteWhole(command.file, cards))
        return Fail(kExitRefused, "Cannot write " + command.file + ": " + std::strerror(errno));
    Result result;
    if (command.json)
        result.out = JsonObject({{"file", Json(command.file)},
                                 {"contacts", std::to_string(entries.size())}}) +
                     "\n";
    else
        result.out =
            std::to_string(entries.size()) + " contacts written to " + command.file + ".\n";
    return result;
}

Result ContactsImport(Context& context, const Command& command) {
    std::string problem;
    if (CheckInputs(command, &problem) != kExitDone) return Fail(kExitUsage, problem);
    std::ifstream in(command.file, std::ios::binary);
    std::ostringstream text;
    text << in.rdbuf();
    if (!in.good() && !in.eof()) return Fail(kExitUsage, "Cannot read " + command.file + ".");
    const AddressBookResult cards = ParseVCards(text.str());
    if (!cards.missingLibrary.empty())
        return Fail(kExitRefused, "Cannot read vCards: " + cards.missingLibrary + " is missing.");
    std::vector<VCardImportEntry> found = VCardsToPhonebook(cards);
    found.erase(std::remove_if(found.begin(), found.end(),
                               [](const VCardImportEntry& e) { return e.number.empty(); }),
                found.end());
    if (found.empty()) return Fail(kExitUsage, "No contact with a number in " + command.file + ".");

    const int storage = command.book == Book::Card ? kStorageCardPhone : kStorageSimCard;
    const char* code = PhonebookStorageName(storage);
    const std::string where = storage == kStorageSimCard ? "SIM" : "card";
    std::vector<PhonebookEntry> existing;
    int32_t total = 0;
    if (!ReadStorage(context.link, storage, &existing, &total))
        return Fail(kExitRefused, "Cannot read the " + where + " phonebook.");
    int32_t numberLength = 0, textLength = 0, highest = 0;
    PhonebookGetGeometry(context.link, &numberLength, &textLength, &highest);
    if (numberLength <= 0) numberLength = kPhonebookNumberSize - 1;
    if (textLength <= 0) textLength = kPhonebookTextSize - 1;
    numberLength = std::min<int32_t>(numberLength, kPhonebookNumberSize - 1);
    textLength = std::min<int32_t>(textLength, kPhonebookTextSize - 1);

    // Everything is checked before the first write, so a refusal leaves the phonebook as it was.
    std::vector<int> free;
    for (int index = 1; index <= total; ++index)
        if (std::none_of(existing.begin(), existing.end(),
                         [index](const PhonebookEntry& e) { return e.index == index; }))
            free.push_back(index);
    if (found.size() > free.size())
        return Fail(kExitRefused, "Not enough room in the " + where + " phonebook: " +
                                      std::to_string(found.size()) + " contacts, " +
                                      std::to_string(free.size()) + " free places.");
    std::vector<PhonebookEntry> entries;
    for (size_t i = 0; i < found.size(); ++i) {
        const std::string number = RecipientNumber(Utf16ToUtf8(found[i].number));
        if (number.empty() || static_cast<int32_t>(number.size()) > numberLength)
            return Fail(kExitUsage, "Not a phone number for \"" + Utf16ToUtf8(found[i].name) +
                                        "\": " + Utf16ToUtf8(found[i].number) + ".");
        PhonebookEntry entry{};
        entry.index = free[i];
        entry.type = number[0] == '+' ? 145 : 129;
        std::snprintf(entry.number, sizeof entry.number, "%s", number.c_str());
        entry.numberLength = static_cast<int32_t>(number.size());
        // The name is cut to what the storage keeps; a character without an 8-bit form
        // shows as '?'.
        int length = 0;
        for (char16_t c : found[i].name) {
            if (length >= textLength) break;
            entry.text[length++] = LatinOrQuestionMark(c);
        }
        entry.textLength = length;
        entries.push_back(entry);
    }
    const int file = storage == kStorageSimCard ? 1 : 2;
    const bool cache = context.caches && CachePresent(context.caches->sim);
    size_t written = 0;
    for (const PhonebookEntry& entry : entries) {
        if (PhonebookWriteEntry(context.link, code, entry) != 0) break;
        if (cache) SimCacheAppend(context.caches->sim, file, entry);
        ++written;
    }
    Result result;
    if (written < entries.size()) {
        result.code = kExitRefused;
        result.err = "The card refused contact \"" + Latin1ToUtf8(entries[written].text, 32) +
                     "\"; " + std::to_string(written) + " of " + std::to_string(entries.size()) +
                     " were written.\n";
    }
    if (command.json)
        result.out = JsonObject({{"book", Json(BookName(storage))},
                                 {"written", std::to_string(written)},
                                 {"ok", result.code == kExitDone ? "true" : "false"}}) +
                     "\n";
    else if (result.code == kExitDone)
        result.out = std::to_string(written) + " contacts written to the " + where + ".\n";
    return result;
}

Result CallLogList(Context& context, const Command& command, CallLog& log) {
    std::vector<std::string> items;
    std::string text;
    for (const LogName& which : kLogs) {
        if (command.log && command.log != which.log) continue;
        for (const CallLogRecord& record : ReadCallLog(log, which.log)) {
            const std::string number = Latin1ToUtf8(record.number, sizeof record.number);
            std::string name;
            char16_t wide[64] = {};
            if (context.caches && record.number[0] &&
                FindNameByNumber(*context.caches, record.number, wide, 64))
                name = WideToUtf8(wide);
            const std::string time = Latin1ToUtf8(record.time, sizeof record.time);
            items.push_back(JsonObject({{"log", Json(which.name)},
                                        {"number", Json(number)},
                                        {"name", Json(name)},
                                        {"time", Json(time)},
                                        {"sequence", std::to_string(record.sequence)}}));
            char head[32];
            std::snprintf(head, sizeof head, "%-10s  ", which.name);
            text += head + time + "  " + (number.empty() ? "No number" : number) +
                    (name.empty() ? "" : "  " + name) + "\n";
        }
    }
    Result result;
    result.out = command.json ? JsonArray(items) + "\n" : text;
    return result;
}

}  // namespace

int ParseCommand(const std::vector<std::string>& args, Command* command, std::string* error) {
    *command = Command{};
    std::vector<std::string> rest;
    for (const std::string& a : args) {
        if (a == "--json")
            command->json = true;
        else
            rest.push_back(a);
    }
    auto usage = [error](const std::string& text) {
        *error = text;
        return kExitUsage;
    };
    if (rest.empty()) return usage("which command?");
    const std::string verb = rest[0];
    const std::string sub = rest.size() > 1 ? rest[1] : "";
    Split split;
    const size_t from = (verb == "sms" || verb == "contacts") ? 2 : 1;
    if (!SplitArguments(rest, from, {"--folder", "--text", "--vcard"}, &split, error))
        return kExitUsage;
    const auto& operands = split.operands;

    if (verb == "status" || verb == "hangup" || verb == "answer" || verb == "events") {
        if (!operands.empty() || !split.options.empty()) return usage(verb + " takes no arguments");
        command->verb = verb == "status"   ? Verb::Status
                        : verb == "hangup" ? Verb::HangUp
                        : verb == "answer" ? Verb::Answer
                                           : Verb::Events;
        return kExitDone;
    }
    if (verb == "dial") {
        if (operands.size() != 1 || !split.options.empty()) return usage("dial takes one NUMBER");
        const std::string& number = operands[0];
        const bool ok =
            !number.empty() && number.size() <= 19 &&
            std::all_of(number.begin(), number.end(),
                        [](char c) {
                            return (c >= '0' && c <= '9') || c == '*' || c == '#' || c == '+';
                        }) &&
            number.find('+', 1) == std::string::npos;
        if (!ok) return usage("not a number to dial: \"" + number + "\"");
        command->verb = Verb::Dial;
        command->number = number;
        return kExitDone;
    }
    if (verb == "calllog") {
        if (operands.size() > 1 || !split.options.empty())
            return usage("calllog takes answered, dialed or unanswered");
        command->verb = Verb::CallLog;
        if (operands.size() == 1) {
            for (const LogName& l : kLogs)
                if (operands[0] == l.name) command->log = l.log;
            if (!command->log) return usage("no call log \"" + operands[0] + "\"");
        }
        return kExitDone;
    }
    if (verb == "sms") {
        if (sub == "send") {
            if (!OnlyOptions(split, {"--text"}, error)) return kExitUsage;
            if (operands.empty()) return usage("sms send needs at least one NUMBER");
            if (split.options.size() != 1) return usage("sms send needs --text TEXT or --text -");
            command->verb = Verb::SmsSend;
            command->numbers = operands;
            command->text = split.options[0].second;
            command->textFromStdin = command->text == "-";
            for (const std::string& n : operands)
                if (RecipientNumber(n).empty()) return usage("not a phone number: \"" + n + "\"");
            return kExitDone;
        }
        if (sub == "list" || sub == "read" || sub == "delete") {
            if (!OnlyOptions(split, {"--folder"}, error)) return kExitUsage;
            command->page = kPageInbox;
            for (const auto& option : split.options) {
                bool known = false;
                for (const PageName& p : kPages)
                    if (option.second == p.name) known = true, command->page = p.page;
                if (!known) return usage("no folder \"" + option.second + "\"");
            }
            if (sub == "list") {
                if (!operands.empty()) return usage("sms list takes no N");
                command->verb = Verb::SmsList;
                return kExitDone;
            }
            if (operands.size() != 1 || !AllDigits(operands[0]) || std::stoi(operands[0]) < 1)
                return usage("sms " + sub + " takes one message number N");
            command->verb = sub == "read" ? Verb::SmsRead : Verb::SmsDelete;
            command->index = std::stoi(operands[0]);
            return kExitDone;
        }
        return usage("sms takes list, read, send or delete");
    }
    if (verb == "contacts") {
        if (sub == "list") {
            if (!OnlyOptions(split, {"--sim", "--card", "--desktop"}, error)) return kExitUsage;
            if (!operands.empty()) return usage("contacts list takes no operands");
            command->verb = Verb::ContactsList;
            return ReadBook(split, true, &command->book, error) ? kExitDone : kExitUsage;
        }
        if (sub == "export" || sub == "import") {
            if (!OnlyOptions(split, {"--vcard", "--sim", "--card", "--desktop"}, error))
                return kExitUsage;
            if (!operands.empty()) return usage("contacts " + sub + " takes --vcard FILE");
            for (const auto& option : split.options)
                if (option.first == "--vcard") command->file = option.second;
            if (command->file.empty()) return usage("contacts " + sub + " needs --vcard FILE");
            command->verb = sub == "export" ? Verb::ContactsExport : Verb::ContactsImport;
            if (!ReadBook(split, false, &command->book, error)) return kExitUsage;
            if (command->verb == Verb::ContactsImport && command->book == Book::All)
                command->book = Book::Sim;
            return kExitDone;
        }
        return usage("contacts takes list, export or import");
    }
    return usage("unknown command \"" + verb + "\"");
}

std::vector<std::string> CommandArguments(const Command& command) {
    std::vector<std::string> args;
    switch (command.verb) {
        case Verb::Status:
            args = {"status"};
            break;
        case Verb::Dial:
            args = {"dial", command.number};
            break;
        case Verb::HangUp:
            args = {"hangup"};
            break;
        case Verb::Answer:
            args = {"answer"};
            break;
        case Verb::Events:
            args = {"events"};
            break;
        case Verb::SmsList:
            args = {"sms", "list", "--folder", PageNameOf(command.page)};
            break;
        case Verb::SmsRead:
        case Verb::SmsDelete:
            args = {"sms", command.verb == Verb::SmsRead ? "read" : "delete",
                    std::to_string(command.index), "--folder", PageNameOf(command.page)};
            break;
        case Verb::SmsSend:
            args = {"sms", "send"};
            args.insert(args.end(), command.numbers.begin(), command.numbers.end());
            args.insert(args.end(), {"--text", command.text});
            break;
        case Verb::ContactsList:
        case Verb::ContactsExport:
        case Verb::ContactsImport: {
            args = {"contacts", command.verb == Verb::ContactsList     ? "list"
                                : command.verb == Verb::ContactsExport ? "export"
                                                                       : "import"};
            if (command.verb != Verb::ContactsList) {
                std::error_code ignored;
                args.insert(args.end(), {"--vcard", fs::absolute(command.file, ignored).string()});
            }
            if (command.book == Book::Sim) args.push_back("--sim");
            if (command.book == Book::Card) args.push_back("--card");
            if (command.book == Book::Desktop) args.push_back("--desktop");
            break;
        }
        case Verb::CallLog:
            args = {"calllog"};
            if (command.log) args.push_back(LogNameOf(command.log));
            break;
    }
    if (command.json) args.push_back("--json");
    return args;
}

bool NeedsCard(const Command& command) {
    switch (command.verb) {
        case Verb::CallLog:
            return false;
        case Verb::ContactsList:
            return command.book != Book::Desktop;
        case Verb::SmsList:
        case Verb::SmsRead:
        case Verb::SmsDelete:
            return command.page == kPageInbox || command.page == kPageOutbox;
        default:
            return true;
    }
}

int CheckInputs(const Command& command, std::string* error) {
    if (command.verb == Verb::SmsSend && !command.textFromStdin) {
        SmsRecord body{};
        return CheckMessageText(command.text, &body, error);
    }
    if (command.verb != Verb::ContactsImport) return kExitDone;
    std::error_code failure;
    const auto size = fs::file_size(command.file, failure);
    if (failure) {
        *error = "Cannot read " + command.file + ": " + failure.message() + ".";
        return kExitUsage;
    }
    if (static_cast<long long>(size) > kMaxVCardFileBytes) {
        *error =
            command.file + " is too large for a phonebook (" + std::to_string(size) + " bytes).";
        return kExitUsage;
    }
    if (access(command.file.c_str(), R_OK) != 0) {
        *error = "Cannot read " + command.file + ": " + std::strerror(errno) + ".";
        return kExitUsage;
    }
    return kExitDone;
}

int CheckMessageText(const std::string& utf8, SmsRecord* body, std::string* error) {
    if (utf8.empty()) {
        *error = "The message text is empty.";
        return kExitUsage;
    }
    if (utf8.size() > kMaxTextBytes) {
        *error = "The message text is too long for a short message.";
        return kExitUsage;
    }
    const std::u16string text = Utf8ToUtf16(utf8);
    bool asked = false;
    const auto refuse = [&asked](const std::u16string&) {
        asked = true;
        return false;
    };
    if (PrepareBody(text, refuse, body)) return kExitDone;
    if (asked) {
        const MessageCount count = CountMessage(text);
        const size_t length = std::max(static_cast<size_t>(count.count), text.size());
        *error = "Short message length exceeded: " + std::to_string(length) +
                 " characters, at most " + std::to_string(count.limit) + " go in one message" +
                 (count.coding == kCodingUcs2 ? " with characters outside the GSM alphabet." : ".");
    } else {
        *error = "The message text cannot be sent as a short message.";
    }
    return kExitUsage;
}

std::string RecipientNumber(const std::string& text) {
    const std::u16string wide = Utf8ToUtf16(text);
    if (wide.empty() || !IsValidPhoneNumber(wide.c_str())) return "";
    std::string number = FilterNumber(wide);
    return number.size() < sizeof(SmsRecord::number) ? number : "";
}

Result Run(Context& context, const Command& command) {
    // The folders and logs live in the install folder, which a first run has yet to make.
    char16_t install[512] = {};
    if (GetInstallPath(context.settings, install, 512)) {
        std::error_code ignored;
        fs::create_directories(Utf16ToUtf8(install), ignored);
    }
    std::unique_ptr<CallLog> ownLog;
    CallLog* log = context.callLog;
    if (!log) {
        ownLog = std::make_unique<CallLog>(context.settings);
        log = ownLog.get();
    }
    switch (command.verb) {
        case Verb::Status:
            return Status(context, command.json);
        case Verb::Dial:
            return Dial(context, command, *log);
        case Verb::HangUp:
            return Simple(HangUp(context.link) == 1, command.json, "Call ended",
                          "The card did not answer.");
        case Verb::Answer: {
            const int code = AnswerCall(context.link);
            return Simple(code == 0, command.json, "Voice call", "No call to answer.");
        }
        case Verb::SmsList:
            return SmsList(context, command);
        case Verb::SmsRead:
            return SmsRead(context, command);
        case Verb::SmsSend:
            return SmsSendAll(context, command);
        case Verb::SmsDelete:
            return SmsDelete(context, command);
        case Verb::ContactsList:
            return ContactsList(context, command);
        case Verb::ContactsExport:
            return ContactsExport(context, command);
        case Verb::ContactsImport:
            return ContactsImport(context, command);
        case Verb::CallLog:
            return CallLogList(context, command, *log);
        case Verb::Events:
            break;
    }
    return Fail(kExitUsage, "events runs only in vqm-phone itself.");
}

std::string FormatEvent(const Event& event, bool json) {
    if (json) {
        std::vector<std::pair<std::string, std::string>> fields = {{"event", Json(event.kind)}};
        if (event.kind == "caller") fields.emplace_back("number", Json(event.value));
        if (event.kind == "message") fields.emplace_back("index", event.value);
        return JsonObject(fields) + "\n";
    }
    return event.kind + (event.value.empty() ? "" : " " + event.value) + "\n";
}

void EventFeed::Take(const char* line, int length) {
    static const struct {
        const char* tag;
        const char* kind;
    } kTags[] = {{"+CRING:", "ring"}, {"+CLIP:", "caller"}, {"+CMTI:", "message"}};
    const std::string text(line, static_cast<size_t>(length));
    for (const auto& tag : kTags) {
        const size_t at = text.find(tag.tag);
        if (at == std::string::npos) continue;
        Event event;
        event.kind = tag.kind;
        const std::string rest = text.substr(at);
        if (event.kind == std::string("caller")) {
            char number[64] = {};
            ParseCallerIdLine(rest.data(), static_cast<int>(rest.size()), link_.firmwareVersion,
                              number, sizeof number);
            event.value = number;
        } else if (event.kind == std::string("message")) {
            const size_t comma = rest.rfind(',');
            const std::string location = comma == std::string::npos ? "" : rest.substr(comma + 1);
            if (!AllDigits(location)) continue;  // not a location: nothing to announce
            event.value = location;
        }
        std::lock_guard<std::mutex> lock(mutex_);
        event.sequence = ++last_;
        events_.push_back(event);
        if (events_.size() > kFeedKeep) events_.pop_front();
        arrived_.notify_all();
        return;
    }
}

int EventFeed::UnsolicitedScan(const char* text, int length) {
    const int queued = next_ ? next_->UnsolicitedScan(text, length) : 0;
    int start = 0;
    for (int i = 0; i <= length; ++i) {
        if (i == length || text[i] == '\r' || text[i] == '\n') {
            if (i > start) Take(text + start, i - start);
            start = i + 1;
        }
    }
    return queued;
}

int EventFeed::QueueLine(const char* line, int length) {
    const int queued = next_ ? next_->QueueLine(line, length) : 0;
    Take(line, length);
    return queued;
}

int EventFeed::DispatchAll(int* rings) {
    return next_ ? next_->DispatchAll(rings) : 0;
}

std::vector<Event> EventFeed::Since(uint64_t since, uint64_t* last) {
    std::lock_guard<std::mutex> lock(mutex_);
    std::vector<Event> found;
    for (const Event& event : events_)
        if (event.sequence > since) found.push_back(event);
    *last = last_;
    return found;
}

bool EventFeed::WaitAfter(uint64_t since, int limitMs) {
    std::unique_lock<std::mutex> lock(mutex_);
    return arrived_.wait_for(lock, std::chrono::milliseconds(limitMs),
                             [&] { return last_ > since; });
}

uint64_t EventFeed::Last() {
    std::lock_guard<std::mutex> lock(mutex_);
    return last_;
}

std::string EncodeRequest(const std::vector<std::string>& args) {
    std::string line = kRequestTag;
    for (const std::string& a : args)
        line += " " + Escape(a);
    return line;
}

bool DecodeRequest(const std::string& line, std::vector<std::string>* args) {
    const std::vector<std::string> fields = Fields(line);
    if (fields.empty() || fields[0] != kRequestTag) return false;
    args->clear();
    for (size_t i = 1; i < fields.size(); ++i) {
        std::string arg;
        if (!Unescape(fields[i], &arg)) return false;
        args->push_back(arg);
    }
    return true;
}

std::string EncodeReply(const Result& result, uint64_t cursor) {
    return std::string(kRequestTag) + " " + std::to_string(result.code) + " " + Escape(result.out) +
           " " + Escape(result.err) + " " + std::to_string(cursor);
}

bool DecodeReply(const std::string& line, Result* result, uint64_t* cursor) {
    const std::vector<std::string> fields = Fields(line);
    if (fields.size() != 5 || fields[0] != kRequestTag || !AllDigits(fields[1])) return false;
    result->code = std::stoi(fields[1]);
    if (!Unescape(fields[2], &result->out) || !Unescape(fields[3], &result->err)) return false;
    if (fields[4].empty() || !std::all_of(fields[4].begin(), fields[4].end(),
                                          [](char c) { return c >= '0' && c <= '9'; }))
        return false;
    if (cursor) *cursor = std::stoull(fields[4]);
    return true;
}

std::string AnswerRequest(Context& context, EventFeed* feed, const std::string& line) {
    std::vector<std::string> args;
    if (!DecodeRequest(line, &args))
        return EncodeReply(Fail(kExitUsage, "The dialer could not read the request."));
    // "events-since N [--json]": what the feed holds after N; "now" only learns the cursor.
    if (!args.empty() && args[0] == "events-since") {
        if (!feed) return EncodeReply(Fail(kExitNoCard, "The dialer does not follow events."));
        const bool json = std::find(args.begin(), args.end(), "--json") != args.end();
        uint64_t last = 0;
        const uint64_t since =
            args.size() > 1 && AllDigits(args[1]) ? std::stoull(args[1]) : feed->Last();
        Result result;
        for (const Event& event : feed->Since(since, &last))
            result.out += FormatEvent(event, json);
        return EncodeReply(result, last);
    }
    Command command;
    std::string error;
    if (ParseCommand(args, &command, &error) != kExitDone)
        return EncodeReply(Fail(kExitUsage, "vqm-phone: " + error));
    if (command.verb == Verb::Events)
        return EncodeReply(Fail(kExitUsage, "vqm-phone: not a request for the dialer"));
    // vqm-phone has read its stdin already: a text of "-" is that text.
    command.textFromStdin = false;
    if (NeedsCard(command) && context.link.portState.load() == 0)
        return EncodeReply(Fail(kExitNoCard, "No card: the dialer is not connected to it."));
    return EncodeReply(Run(context, command));
}

}  // namespace vqm::phone
