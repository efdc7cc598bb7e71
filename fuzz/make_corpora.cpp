// Writes the starting corpora of the fuzz targets into <folder>/<target>/: the simulated card's
// replies to the commands the dialer sends (its demo SIM, on both personalities), message PDUs
// from the codec tests, and files written by the program's own writers (folder records, the
// transfer file, the index lists, vCards). scripts/fuzz_corpora.sh builds and runs it.
//   vqm-fuzz-corpora <folder>
#include <algorithm>
#include <chrono>
#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <filesystem>
#include <fstream>
#include <map>
#include <memory>
#include <string>
#include <vector>

#include "cardsim/card_engine.h"
#include "cardsim/command_set.h"
#include "contacts/address_book.h"
#include "contacts/phonebook_at.h"
#include "messaging/message_store.h"
#include "messaging/sms_at.h"
#include "support/settings_store.h"
#include "support/text.h"
#include "tests/common/temp_folder.h"

namespace fs = std::filesystem;
using namespace std::chrono_literals;
using namespace std::string_literals;

namespace {

std::string g_root;
std::map<std::string, int> g_counts;

// One input file; the names only number the inputs of a target.
void AddInput(const std::string& target, const std::string& bytes) {
    const fs::path folder = fs::path(g_root) / target;
    fs::create_directories(folder);
    char name[32];
    std::snprintf(name, sizeof name, "input-%02d", ++g_counts[target]);
    std::ofstream(folder / name, std::ios::binary) << bytes;
}

// An input whose first byte picks the parser of a target that serves several.
void Picked(const std::string& target, uint8_t selector, const std::string& reply) {
    AddInput(target, std::string(1, static_cast<char>(selector)) + reply);
}

std::string ReadFile(const std::string& path) {
    std::ifstream in(path, std::ios::binary);
    return std::string(std::istreambuf_iterator<char>(in), {});
}

// The simulated card with its demo SIM, echo off, as the dialer leaves it after start-up.
class Card {
  public:
    explicit Card(vqm::cardsim::Dialect dialect) : engine_(Config(dialect)) {
        for (auto& set : vqm::cardsim::StandardCommandSets())
            engine_.AddCommandSet(std::move(set));
        for (const auto& set : engine_.CommandSets())
            set->FillDemo();
        Ask("ATE0");
    }
    std::string Ask(const std::string& command) {
        const std::string line = command + "\r";
        engine_.Feed(line.data(), line.size(), now_);
        return engine_.TakeOutput();
    }
    std::string Advance(vqm::cardsim::Clock::duration by) {
        now_ += by;
        engine_.Tick(now_);
        return engine_.TakeOutput();
    }
    vqm::cardsim::CardEngine& Engine() { return engine_; }
    vqm::cardsim::Clock::time_point Now() const { return now_; }

  private:
    static vqm::cardsim::EngineConfig Config(vqm::cardsim::Dialect dialect) {
        vqm::cardsim::EngineConfig config;
        config.dialect = dialect;
        return config;
    }
    vqm::cardsim::CardEngine engine_;
    vqm::cardsim::Clock::time_point now_ = vqm::cardsim::Clock::time_point{} + 1h;
};

// "+CMGR:" replies around PDUs from the codec tests: a full deliver PDU with its centre, the
// two concatenation headers, an alphanumeric sender and a stored message.
std::vector<std::string> TestPduReplies() {
    const std::string stamp = "20301141526300";
    const auto reply = [](int stat, const std::string& pdu) {
        return "\r\n+CMGR: " + std::to_string(stat) + ",," + std::to_string(pdu.size() / 2 - 1) +
               "\r\n" + pdu + "\r\n\r\nOK\r\n";
    };
    return {
        "\r\n+CMGR: 1,,36\r\n07912143658709F1040B918100551512F20000111010214365000BE8329BFD4697"
        "D9EC37\r\n\r\nOK\r\n",
        reply(1, "0044049144210000" + stamp + "09050003A702019069"),
        reply(1, "0044049144210008" + stamp + "0906080401F403020041"),
        reply(1, "000407D0C2B07B0D0000" + stamp + "02C834"),
        reply(2, "001100049144210000A702C834"),
    };
}

void CardReplyInputs() {
    for (const auto dialect : {vqm::cardsim::Dialect::Card, vqm::cardsim::Dialect::Standard}) {
        Card card(dialect);
        const std::string identity = card.Ask("AT+GMI") + card.Ask("AT+GMM");
        const std::string firmware = card.Ask("AT+GMR");
        const std::string signal = card.Ask("AT+CSQ");
        const std::string network = card.Ask("AT+COPS?");
        const std::string volume = card.Ask("AT+CLVL?");
        const std::string noCall = card.Ask("AT+CLCC");
        // A ring with the caller's number, then the call answered and listed.
        card.Engine().Ring("+447700900123", card.Now());
        const std::string ring = card.Advance(10ms);
        card.Ask("ATA");
        const std::string call = card.Ask("AT+CLCC");
        // A second caller while the first talks, announced where call waiting is on.
        card.Ask("AT+CCWA=1,1,1");
        card.Engine().RingWaiting("+306944123456", true, card.Now());
        const std::string waitingLine = card.Advance(10ms);
        card.Ask("ATH");

        AddInput("fuzz_reply_parsing", call);
        AddInput("fuzz_reply_parsing", ring);
        AddInput("fuzz_reply_parsing", card.Ask("AT+CMGR=2"));
        Picked("fuzz_device_replies", 0, identity + firmware);
        Picked("fuzz_device_replies", 1, signal);
        Picked("fuzz_device_replies", 2 + 8 * 4, network);
        Picked("fuzz_device_replies", 3, volume);
        Picked("fuzz_device_replies", 4, call);
        Picked("fuzz_device_replies", 4, noCall);
        Picked("fuzz_device_replies", 5 + 8 * 3, ring);  // firmware 4.00: the number quoted
        Picked("fuzz_device_replies", 6 + 8 * 1, ring);  // firmware 3.80
        Picked("fuzz_device_replies", 7, call);

        card.Ask("AT+CPBS=\"SM\"");
        AddInput("fuzz_phonebook_entry", card.Ask("AT+CPBR=1,10"));
        AddInput("fuzz_phonebook_entry", card.Ask("AT+CPBS?"));
        AddInput("fuzz_phonebook_entry", card.Ask("AT+CPBR=?"));

        Picked("fuzz_settings_replies", 0 + 6 * 4, card.Ask("AT+COPS=?"));
        Picked("fuzz_settings_replies", 1, network);
        Picked("fuzz_settings_replies", 2 + 6 * 20, card.Ask("AT+CCFC=0,2"));
        card.Ask("AT+CCFC=2,3,\"+447700900456\",145,,,20");
        Picked("fuzz_settings_replies", 2 + 6 * 20, card.Ask("AT+CCFC=2,2"));
        Picked("fuzz_settings_replies", 3, card.Ask("AT+CLCK=\"AO\",2"));
        Picked("fuzz_settings_replies", 4, card.Ask("AT+CLCK=\"SC\",2"));
        Picked("fuzz_settings_replies", 5, card.Ask("AT+CCWA=1,2,1"));
        Picked("fuzz_settings_replies", 5 + 6 * 30, waitingLine);

        card.Ask("AT+CMGF=0");
        for (int location = 1; location <= 4; ++location)
            AddInput("fuzz_sms_pdu", card.Ask("AT+CMGR=" + std::to_string(location)));
        card.Ask("AT+CMGF=1");
        AddInput("fuzz_sms_pdu", card.Ask("AT+CMGR=3"));
    }
    for (const std::string& reply : TestPduReplies())
        AddInput("fuzz_sms_pdu", reply);
}

// The demo SIM's messages as the dialer reads them, and its phonebook's entries.
std::vector<vqm::SmsRecord> DemoMessages() {
    Card card(vqm::cardsim::Dialect::Card);
    card.Ask("AT+CMGF=0");
    std::vector<vqm::SmsRecord> records;
    for (int location = 1; location <= 4; ++location) {
        const std::string reply = card.Ask("AT+CMGR=" + std::to_string(location));
        vqm::SmsRecord record{};
        record.index = location;
        if (vqm::SmsParsePduReply(reply.data(), static_cast<int>(reply.size()), &record))
            records.push_back(record);
    }
    for (const std::string& reply : TestPduReplies()) {
        vqm::SmsRecord record{};
        record.index = static_cast<int>(records.size()) + 1;
        if (vqm::SmsParsePduReply(reply.data(), static_cast<int>(reply.size()), &record))
            records.push_back(record);
    }
    return records;
}

std::vector<vqm::PhonebookEntry> DemoPhonebook() {
    Card card(vqm::cardsim::Dialect::Card);
    card.Ask("AT+CPBS=\"SM\"");
    const std::string reply = card.Ask("AT+CPBR=1,10");
    std::vector<vqm::PhonebookEntry> entries(10);
    const int found =
        vqm::PhonebookParseRange(reply.data(), static_cast<int>(reply.size()), entries.data(), 10);
    entries.resize(static_cast<size_t>(found > 0 ? found : 0));
    return entries;
}

// Files written by the program's own writers into a scratch install folder.
void StoreInputs() {
    vqm::testing::TempFolder folder;
    vqm::SettingsStore settings(":memory:");
    vqm::SetSettingString(settings, u"InstallPath", vqm::Utf8ToUtf16(folder.Path() + "/").c_str());
    vqm::MessageStore store(settings);
    vqm::StoreGuardCreate(store);
    const std::vector<vqm::SmsRecord> messages = DemoMessages();
    const std::string local = vqm::StoreFolderPath(store, vqm::kFolderLocal);

    // Folders of one, of four and of two records with a torn third; the last shows the parts
    // of a concatenated message, one of them missing.
    const auto folderOf = [&](const std::vector<vqm::SmsRecord>& records, size_t torn) {
        std::remove(local.c_str());
        for (const vqm::SmsRecord& record : records)
            vqm::StoreAppend(store, vqm::kFolderLocal, record);
        std::string bytes = ReadFile(local);
        if (torn > 0) bytes += std::string(reinterpret_cast<const char*>(&records[0]), torn);
        AddInput("fuzz_message_store", bytes);
    };
    if (messages.size() < 5) std::abort();
    folderOf({messages[0]}, 0);
    folderOf({messages[0], messages[1], messages[2], messages[3]}, 0);
    folderOf({messages[2], messages[3]}, 300);
    vqm::SmsRecord first = messages[1], third = messages[1];
    vqm::SmsSetPart(&first, {0xA7, 3, 1});
    vqm::SmsSetPart(&third, {0xA7, 3, 3});
    third.index = 9;
    folderOf({first, third, messages[4]}, 0);

    // The transfer file as a copy and the write view's drafts leave it.
    const std::string clipboard = vqm::ClipboardPath(store);
    vqm::ClipboardAppend(store, messages[0]);
    Picked("fuzz_transfer_files", 0, ReadFile(clipboard));
    const std::u16string greek = u"Καλημέρα! Τα λέμε αύριο;";
    const std::u16string plain = u"Call the bank tomorrow";
    vqm::ClipboardCopyText(store, plain.data(), plain.size());
    vqm::ClipboardCopyText(store, greek.data(), greek.size());
    Picked("fuzz_transfer_files", 2, ReadFile(clipboard));
    vqm::ClipboardRemove(store);

    // The companion's import file: one record for each folder it names, one it does not, and
    // a Latin-1 text that needs UCS2.
    const auto pc = [](const char* folder, const char* number, const char* date, const char* text) {
        vqm::PcMessage m{};
        std::snprintf(m.folder, sizeof m.folder, "%s", folder);
        std::snprintf(m.number, sizeof m.number, "%s", number);
        std::memcpy(m.date, date, std::min(std::strlen(date), sizeof m.date));
        std::snprintf(m.text, sizeof m.text, "%s", text);
        return std::string(reinterpret_cast<const char*>(&m), sizeof m);
    };
    Picked("fuzz_transfer_files", 1,
           pc("DRAFT", "", "", "Draft text") +
               pc("STO SENT", "+447700900123", "02/03/11,14:25:36", "Sent from the desktop"));
    Picked("fuzz_transfer_files", 1,
           pc("PDA", "+306944123456", "99/12/31,23:59:58", "Gr\xfc\xdf Gott \xbd") +
               pc("INBOX", "6977654321", "02/03/11,14:25:36", "Skipped"));
    Picked("fuzz_transfer_files", 3,
           pc("STO SENT", "2101234567", "02/03/11,14:25:36", "Torn") + std::string(100, 'z'));
}

// The index lists as the dialer writes them: "NewIdx", a NUL, then "UnreadIdx".
void IndexListInputs() {
    vqm::SettingsStore settings(":memory:");
    const auto list = [&](const char16_t* name) {
        char16_t text[vqm::kMaxSettingLength + 1] = {};
        vqm::GetSettingString(settings, name, text, vqm::kMaxSettingLength + 1);
        return vqm::Utf16ToUtf8(text);
    };
    for (int location : {3, 12, 7})
        vqm::IndexListAdd(settings, vqm::kNewIdx, location);
    for (int location : {12, 1})
        vqm::IndexListAdd(settings, vqm::kUnreadIdx, location);
    AddInput("fuzz_index_lists", list(vqm::kNewIdx) + std::string(1, '\0') + list(vqm::kUnreadIdx));
    vqm::IndexListRemove(settings, vqm::kNewIdx, 12);
    AddInput("fuzz_index_lists", list(vqm::kNewIdx));
    for (int location = 1; location <= 50; ++location)
        vqm::IndexListAdd(settings, vqm::kUnreadIdx, location);
    AddInput("fuzz_index_lists", std::string(1, '\0') + list(vqm::kUnreadIdx));
}

// The demo SIM's phonebook as Export writes it, and cards from other programs: vCard 2.1 with
// quoted-printable and several numbers, a folded line, a card inside another, and a NUL byte.
void VCardInputs() {
    std::string missing;
    const std::string exported = vqm::PhonebookToVCards(DemoPhonebook(), &missing);
    if (exported.empty()) {
        std::fprintf(stderr, "no vCards written: %s is missing\n", missing.c_str());
        std::exit(1);
    }
    AddInput("fuzz_vcard_import", exported);
    AddInput("fuzz_vcard_import",
             "BEGIN:VCARD\r\nVERSION:2.1\r\nN;CHARSET=ISO-8859-1;ENCODING=QUOTED-PRINTABLE:"
             "Martin;Chlo=E9\r\nFN:Chlo=E9 Martin\r\nTEL;HOME;VOICE:01632 960001\r\n"
             "TEL;WORK;VOICE:+44 (20) 7946-0123\r\nTEL;CELL:+447700900789\r\nEND:VCARD\r\n");
    AddInput("fuzz_vcard_import",
             "BEGIN:VCARD\nVERSION:3.0\nFN:Dentist on the\n  high street\nORG:Surgery\n"
             "TEL;TYPE=WORK,FAX:01632960556\nTEL;TYPE=HOME:01632960555\nEND:VCARD\n"
             "BEGIN:VCARD\nVERSION:2.1\nFN:Office\nAGENT:\nBEGIN:VCARD\nFN:Reception\n"
             "TEL:02079460100\nEND:VCARD\nTEL;WORK:02079460123\nEND:VCARD\n");
    // The shape of the target's first find: a NUL byte behind a quoted-printable '='.
    AddInput("fuzz_vcard_import",
             "BEGIN:VCARD\r\nVERSION:2.1\r\nN;ENCODING=QUOTED-PRINTABLE:Martin;Chlo=\0E9\r\n"
             "TEL;CELL:+447700900789\r\nEND:VCARD\r\n"s);
}

}  // namespace

int main(int argc, char** argv) {
    if (argc != 2) {
        std::fprintf(stderr, "usage: vqm-fuzz-corpora <folder>\n");
        return 2;
    }
    g_root = argv[1];
    CardReplyInputs();
    StoreInputs();
    IndexListInputs();
    VCardInputs();
    for (const auto& [target, count] : g_counts)
        std::printf("%-24s %d inputs\n", target.c_str(), count);
    return 0;
}
