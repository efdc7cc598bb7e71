// vqm-phone end to end, run as a script runs it, against vqm-cardsim in both personalities:
// once on its own (it opens the card's port) and once while vqm-dialer runs (the commands go
// through the dialer's socket and run on its link). --json output is read with Qt's parser.
#include <gtest/gtest.h>
#include <sys/stat.h>

#include <QJsonArray>
#include <QJsonDocument>
#include <QJsonObject>
#include <QStringList>
#include <algorithm>
#include <chrono>
#include <cstdio>
#include <filesystem>
#include <fstream>
#include <map>
#include <sstream>
#include <string>
#include <tuple>
#include <vector>

#include "calls/call_log.h"
#include "link/link.h"
#include "messaging/message_store.h"
#include "messaging/sms_folder.h"
#include "messaging/write_sms.h"
#include "support/local_socket.h"
#include "support/settings_store.h"
#include "support/text.h"
#include "tests/common/process.h"
#include "tests/common/temp_folder.h"

namespace vqm {
namespace {

namespace fs = std::filesystem;
using namespace std::chrono_literals;
using testing::Background;
using testing::RunShell;
using testing::WaitFor;

struct PhoneRun {
    std::string output;
    int code;
};

std::string ReadFile(const std::string& path) {
    std::ifstream file(path);
    std::ostringstream text;
    text << file.rdbuf();
    return text.str();
}

QJsonDocument Parse(const std::string& output) {
    QJsonParseError error{};
    QJsonDocument document = QJsonDocument::fromJson(QByteArray::fromStdString(output), &error);
    EXPECT_EQ(error.error, QJsonParseError::NoError) << output;
    return document;
}

// (personality of the card, whether a dialer runs)
class VqmPhoneTest : public ::testing::TestWithParam<std::tuple<const char*, bool>> {
  protected:
    VqmPhoneTest() {
        fs::create_directories(run_);
        chmod((temp_ / "xdg").c_str(), 0700);
        chmod(run_.c_str(), 0700);
        SettingsStore settings(temp_ / "settings.db");
        SetSettingString(settings, u"PnpId", u"TAVRO_CARD_PHONE");
        // The card keeps the message centre it has: with no choice stored, the dialer would
        // put the SIM's default (none on the simulated card) in its place at start-up.
        const int32_t keep = 0;
        SetSettingInt(settings, u"SettingsMessagesUseSIMDefault", &keep);
        // The folders and logs where the programs keep them (XDG_DATA_HOME below), named here so
        // that a case can file into them itself; the desktop book is a vCard folder of the test.
        fs::create_directories(install_);
        SetSettingString(settings, u"InstallPath", Utf8ToUtf16(install_).c_str());
        fs::create_directories(temp_ / "contacts");
        SetSettingString(settings, u"ContactsFolder", Utf8ToUtf16(temp_ / "contacts").c_str());
    }
    ~VqmPhoneTest() override {
        if (ServerAnswers(DialerSocket())) SendWindowMessage(DialerSocket(), 273, 40016, 0, 2000);
        dialer_.WaitExit(10s);
    }
    bool ViaDialer() const { return std::get<1>(GetParam()); }
    std::string Environment() const {
        return "env XDG_RUNTIME_DIR=" + temp_.Path() +
               "/xdg VQM_SETTINGS_DB=" + (temp_ / "settings.db") +
               " XDG_DATA_HOME=" + (temp_ / "data") +
               " QT_QPA_PLATFORM=offscreen DBUS_SESSION_BUS_ADDRESS=unix:path=/nonexistent ";
    }
    std::string DialerSocket() const { return WindowSocketPath(run_, "DIALERAPP_CLASS"); }

    // The card, powered, and the dialer connected to it when the case runs through one.
    void Start() {
        card_.Start(Environment() + VQM_CARDSIM + " --powered --dial-delay-ms 300 --dialect " +
                    std::get<0>(GetParam()) + " --state-dir " + (temp_ / "state") + " >" +
                    (temp_ / "cardsim.out") + " 2>&1");
        ASSERT_TRUE(
            WaitFor([&] { return ServerAnswers(WindowSocketPath(run_, kCompanionClass)); }));
        if (!ViaDialer()) return;
        dialer_.Start(Environment() + VQM_DIALER + " --ui-log " + (temp_ / "ui.log") +
                      " --answer-boxes ok >" + (temp_ / "dialer.out") + " 2>&1");
        ASSERT_TRUE(WaitFor([&] { return ServerAnswers(DialerSocket()); }, 10s));
        ASSERT_TRUE(WaitFor(
            [&] {
                return ReadFile(temp_ / "ui.log").find("card 2 connected") != std::string::npos;
            },
            20s))
            << ReadFile(temp_ / "ui.log");
    }
    // vqm-phone with its stdout alone (stderr goes to phone.err).
    PhoneRun Phone(const std::string& arguments, const std::string& input = "") {
        const auto [output, code] = RunShell("(" + input + Environment() + VQM_PHONE + " " +
                                             arguments + " 2>" + (temp_ / "phone.err") + ")");
        return {output, code};
    }
    std::string Errors() const { return ReadFile(temp_ / "phone.err"); }
    int Ctl(const std::string& command) {
        return RunShell(Environment() + VQM_CARDSIM + " ctl " + command).second;
    }
    // The simulated card's own account of its call: "none", "incoming", "active", ...
    std::string CardCall() {
        const std::string status = RunShell(Environment() + VQM_CARDSIM + " ctl status").first;
        const size_t at = status.find("call=");
        return at == std::string::npos ? "" : status.substr(at + 5, status.find(' ', at) - at - 5);
    }
    QJsonArray Array(const std::string& arguments) {
        const PhoneRun run = Phone("--json " + arguments);
        EXPECT_EQ(run.code, 0) << arguments << ": " << Errors();
        return Parse(run.output).array();
    }
    std::string WriteVCards(const std::string& name, int count, const std::string& who = "Person",
                            int first = 10000) {
        const std::string path = temp_ / name;
        std::ofstream file(path);
        for (int i = 0; i < count; ++i)
            file << "BEGIN:VCARD\r\nVERSION:3.0\r\nFN:" << who << " " << i
                 << "\r\nTEL;TYPE=CELL:+4477009" << first + i << "\r\nEND:VCARD\r\n";
        return path;
    }
    // A folder's listing: its rows by number, each with the start of its text.
    struct FolderCase {
        std::string arguments, folder, memory;
        std::vector<std::pair<QString, QString>> rows;  // number, start of the preview
    };
    void ExpectPage(const FolderCase& c) {
        SCOPED_TRACE(c.arguments);
        const QJsonArray page = Array(c.arguments);
        ASSERT_EQ(page.size(), static_cast<qsizetype>(c.rows.size()))
            << QJsonDocument(page).toJson().toStdString();
        for (const auto& [number, text] : c.rows) {
            const auto row = std::find_if(page.begin(), page.end(), [&](const QJsonValue& v) {
                return v.toObject()["number"].toString() == number;
            });
            ASSERT_NE(row, page.end()) << number.toStdString();
            const QJsonObject found = row->toObject();
            EXPECT_TRUE(found["preview"].toString().startsWith(text))
                << found["preview"].toString().toStdString();
            EXPECT_EQ(found["folder"].toString().toStdString(), c.folder);
            EXPECT_EQ(found["memory"].toString().toStdString(), c.memory);
        }
    }
    // A draft saved as the Write SMS view saves one and a message pasted onto the PC page,
    // both filed by the SMS Folder's own paste, as a user leaves them before vqm-phone runs.
    void FillComputerPages() {
        SettingsStore settings(temp_ / "settings.db");
        MessageStore store(settings);
        StoreGuardCreate(store);
        Link link(settings, {});  // the computer's pages never reach the card
        const FolderUi ui;
        store.hooks.pasteInto = [&](int page) { PasteIntoPage(store, link, page, ui); };
        ASSERT_EQ(SaveDraft(store, u"Buy milk on the way home"), 1);
        SmsRecord kept{};
        const std::u16string text = u"Kept on the computer";
        ASSERT_GT(RecordBodyFromText(text.data(), text.size(), &kept), 0);
        std::snprintf(kept.number, sizeof kept.number, "+447700900777");
        StampLocalTime(&kept);
        ASSERT_EQ(ClipboardAppend(store, kept), 1);
        ASSERT_EQ(PasteIntoPage(store, link, kPagePda, ui), 1);
    }
    // Calls the dial pad would have logged: one answered, two unanswered (one without a number).
    void FillCallLogs() {
        SettingsStore settings(temp_ / "settings.db");
        CallLog log(settings);
        ASSERT_EQ(AddAnsweredCall(log, "+447700900111"), 1);
        ASSERT_EQ(AddUnansweredCall(log, "+447700900222"), 1);
        ASSERT_EQ(AddUnansweredCall(log, "No number"), 1);
    }

    const testing::TempFolder temp_;
    const std::string run_ = temp_ / "xdg/VQMFull";
    const std::string install_ = temp_ / "data/VQMFull/";
    Background card_;
    Background dialer_;
};

TEST_P(VqmPhoneTest, StatusNamesTheCardItsNetworkAndSignal) {
    Start();
    const PhoneRun run = Phone("--json status");
    ASSERT_EQ(run.code, 0) << Errors();
    const QJsonObject status = Parse(run.output).object();
    EXPECT_TRUE(status["model"].toString().contains("CARD PHONE") ||
                status["model"].toString().size() > 0)
        << run.output;
    EXPECT_EQ(status["power"].toString(), "ready");
    EXPECT_FALSE(status["operator"].toString().isEmpty()) << run.output;
    const int bars = status["signal"].toInt(-2);
    EXPECT_TRUE(bars >= 0 && bars <= 4) << run.output;
    EXPECT_FALSE(status["firmware"].toString().isEmpty());
}

TEST_P(VqmPhoneTest, DialsHangsUpAndLogsTheCall) {
    ASSERT_NO_FATAL_FAILURE(FillCallLogs());
    Start();
    PhoneRun run = Phone("dial 5550100");
    EXPECT_EQ(run.code, 0) << run.output << Errors();
    EXPECT_EQ(run.output, "Voice call\n");
    EXPECT_EQ(CardCall(), "active");
    run = Phone("hangup");
    EXPECT_EQ(run.code, 0) << Errors();
    EXPECT_EQ(CardCall(), "none");

    // Each log alone, and all three in the Call Log view's order; rows are "log number".
    struct LogCase {
        std::string arguments;
        std::vector<std::string> rows;
    };
    const std::vector<LogCase> cases = {
        {"calllog answered", {"answered +447700900111"}},
        {"calllog dialed", {"dialed 5550100"}},
        {"calllog unanswered", {"unanswered +447700900222", "unanswered "}},
        {"calllog",
         {"answered +447700900111", "dialed 5550100", "unanswered +447700900222", "unanswered "}},
    };
    for (const LogCase& c : cases) {
        std::vector<std::string> rows;
        for (const QJsonValue& row : Array(c.arguments))
            rows.push_back(
                (row.toObject()["log"].toString() + " " + row.toObject()["number"].toString())
                    .toStdString());
        EXPECT_EQ(rows, c.rows) << c.arguments;
    }
    run = Phone("calllog unanswered");
    EXPECT_EQ(run.code, 0) << Errors();
    EXPECT_NE(run.output.find("No number"), std::string::npos) << run.output;
}

TEST_P(VqmPhoneTest, AnswersARingingCallAndRefusesWhenNothingRings) {
    Start();
    PhoneRun run = Phone("answer");
    EXPECT_EQ(run.code, 1) << run.output;
    ASSERT_EQ(Ctl("ring +447700900999"), 0);
    ASSERT_EQ(CardCall(), "incoming");
    run = Phone("answer");
    EXPECT_EQ(run.code, 0) << Errors();
    EXPECT_EQ(CardCall(), "active");
}

TEST_P(VqmPhoneTest, SendsToEachRecipientAndFilesOnTheSentPage) {
    Start();
    PhoneRun run = Phone("--json sms send +447700900123 '0 1632 960001' --text -",
                         "printf 'Caf\\303\\251 \\342\\202\\254 ok\\n' | ");
    ASSERT_EQ(run.code, 0) << Errors();
    const QJsonObject sent = Parse(run.output).object();
    EXPECT_EQ(sent["coding"].toString(), "ucs2");  // the euro sign is not 7-bit here
    EXPECT_EQ(sent["sent"].toArray().size(), 2);
    const QJsonArray page = Array("sms list --folder sent");
    ASSERT_EQ(page.size(), 2);
    QStringList numbers;
    for (const QJsonValue& row : page) {
        numbers << row.toObject()["number"].toString();
        EXPECT_EQ(row.toObject()["preview"].toString(), QString::fromUtf8("Café € ok"));
    }
    numbers.sort();
    EXPECT_EQ(numbers, (QStringList{"+447700900123", "01632960001"}));
}

TEST_P(VqmPhoneTest, ListsEachFolderAndReadsAMessageWhole) {
    ASSERT_NO_FATAL_FAILURE(FillComputerPages());
    Start();
    // The demo SIM's unsent message and the computer's pages (the Inbox is listed after a
    // delete, below).
    const std::vector<FolderCase> cases = {
        {"sms list --folder outbox", "outbox", "sim", {{"2101234567", "Call the bank tomorrow"}}},
        {"sms list --folder sent", "sent", "pc", {}},
        {"sms list --folder draft", "draft", "pc", {{"", "Buy milk on the way home"}}},
        {"sms list --folder pc", "pc", "pc", {{"+447700900777", "Kept on the computer"}}},
    };
    for (const FolderCase& c : cases)
        ExpectPage(c);
    // For people: one line a message, or a word that the folder is empty.
    PhoneRun run = Phone("sms list --folder draft");
    EXPECT_EQ(run.code, 0) << Errors();
    EXPECT_NE(run.output.find("Buy milk on the way home\n"), std::string::npos) << run.output;
    run = Phone("sms list --folder sent");
    EXPECT_EQ(run.output, "No messages in sent.\n");

    run = Phone("--json sms read 1");
    ASSERT_EQ(run.code, 0) << Errors();
    const QJsonObject message = Parse(run.output).object();
    EXPECT_EQ(message["index"].toInt(), 1);
    EXPECT_EQ(message["folder"].toString(), "inbox");
    EXPECT_TRUE(message["text"].toString().startsWith("Welcome")) << run.output;
    run = Phone("sms read 9 --folder pc");
    EXPECT_EQ(run.code, 2) << run.output;
    EXPECT_NE(Errors().find("No message 9 in pc."), std::string::npos) << Errors();
}

TEST_P(VqmPhoneTest, DeletesAnInboxMessageFromTheSim) {
    Start();
    const PhoneRun run = Phone("sms delete 2");
    ASSERT_EQ(run.code, 0) << run.output << Errors();
    // The Inbox (the folder listed by default) read afresh from the SIM: the demo's first and
    // third messages are left.
    ExpectPage({"sms list",
                "inbox",
                "sim",
                {{"+306944123456", "Welcome to your new SIM."},
                 {"6977654321", QString::fromUtf8("Καλημέρα!")}}});
}

TEST_P(VqmPhoneTest, ExportsTheSimAndCardContactsAsVCards) {
    Start();
    const std::string exported = temp_ / "out.vcf";
    PhoneRun run = Phone("contacts export --vcard " + exported);
    ASSERT_EQ(run.code, 0) << Errors();
    const std::string cards = ReadFile(exported);
    size_t count = 0;
    for (size_t at = cards.find("BEGIN:VCARD"); at != std::string::npos;
         at = cards.find("BEGIN:VCARD", at + 1))
        ++count;
    EXPECT_EQ(count, 11u) << cards;  // the demo SIM's 8 and the card's 3
    EXPECT_NE(cards.find("Alice Smith"), std::string::npos);
}

TEST_P(VqmPhoneTest, ImportsContactsIntoFreePlacesAndListsEachBook) {
    WriteVCards("contacts/desk.vcf", 2, "Desk", 20000);
    Start();
    const PhoneRun run = Phone("contacts import --card --vcard " + WriteVCards("two.vcf", 2));
    ASSERT_EQ(run.code, 0) << Errors();
    // Entries of each book a listing holds: the demo SIM's 8, the card's 3 and the two imported,
    // the desktop folder's 2.
    struct BookCase {
        std::string arguments;
        int sim, card, desktop;
    };
    const std::vector<BookCase> cases = {
        {"contacts list --card", 0, 5, 0},
        {"contacts list --desktop", 0, 0, 2},
        {"contacts list", 8, 5, 2},
    };
    for (const BookCase& c : cases) {
        SCOPED_TRACE(c.arguments);
        const QJsonArray list = Array(c.arguments);
        std::map<std::string, int> books;
        std::map<std::string, std::string> last;  // the last name and number of each book
        for (const QJsonValue& v : list) {
            const QJsonObject entry = v.toObject();
            const std::string book = entry["book"].toString().toStdString();
            ++books[book];
            last[book] =
                (entry["name"].toString() + " " + entry["number"].toString()).toStdString();
        }
        EXPECT_EQ(books["sim"], c.sim);
        EXPECT_EQ(books["card"], c.card);
        EXPECT_EQ(books["desktop"], c.desktop);
        EXPECT_EQ(books.size(), 3u);  // no other book named
        if (c.card) {
            EXPECT_EQ(last["card"], "Person 1 +447700910001");
        }
        if (c.desktop) {
            EXPECT_EQ(last["desktop"], "Desk 1 +447700920001");
        }
    }
}

TEST_P(VqmPhoneTest, TenThousandContactsAreRefusedWithNothingWritten) {
    Start();
    const PhoneRun run = Phone("contacts import --vcard " + WriteVCards("many.vcf", 10000));
    EXPECT_EQ(run.code, 1) << run.output;
    EXPECT_NE(Errors().find("Not enough room in the SIM phonebook: 10000 contacts"),
              std::string::npos)
        << Errors();
    EXPECT_EQ(Array("contacts list --sim").size(), 8);
}

TEST_P(VqmPhoneTest, FollowsRingsCallerIdsAndNewMessages) {
    Start();
    Background events(Environment() + VQM_PHONE + " --json events >" + (temp_ / "events.out") +
                      " 2>" + (temp_ / "events.err"));
    ASSERT_TRUE(WaitFor(
        [&] { return ReadFile(temp_ / "events.err").find("following") != std::string::npos; }, 15s))
        << ReadFile(temp_ / "events.err");
    ASSERT_EQ(Ctl("ring +447700900555"), 0);
    ASSERT_EQ(Ctl("deliver +447700900123 Hi"), 0);
    const auto shows = [&](const std::string& text) {
        return WaitFor(
            [&] { return ReadFile(temp_ / "events.out").find(text) != std::string::npos; }, 10s);
    };
    EXPECT_TRUE(shows("{\"event\":\"ring\"}")) << ReadFile(temp_ / "events.out");
    EXPECT_TRUE(shows("{\"event\":\"caller\",\"number\":\"+447700900555\"}"))
        << ReadFile(temp_ / "events.out");
    EXPECT_TRUE(shows("{\"event\":\"message\",\"index\":")) << ReadFile(temp_ / "events.out");
    EXPECT_EQ(events.Stop(), 0);
    // One JSON object a line.
    std::istringstream lines(ReadFile(temp_ / "events.out"));
    for (std::string line; std::getline(lines, line);)
        EXPECT_TRUE(Parse(line).isObject()) << line;
}

TEST_P(VqmPhoneTest, BadInputIsRefusedWithItsExitCode) {
    Start();
    struct BadCase {
        std::string arguments, input, says;
    };
    const std::string missing = temp_ / "missing.vcf";
    const std::vector<BadCase> cases = {
        {"dial 12ab", "", "not a number to dial"},
        {"sms send 12345 --text ''", "", "empty"},
        {"sms send 12345 --text -", "printf '' | ", "empty"},
        {"sms send 12345 --text -", "head -c 10000000 /dev/zero | tr '\\0' a | ", "too long"},
        {"sms send 12345 --text " + std::string(161, 'a'), "", "160"},
        {"sms send Bob --text hi", "", "not a phone number"},
        {"contacts import --vcard " + missing, "", "missing.vcf"},
        {"sms list --folder bin", "", "no folder"},
    };
    for (const BadCase& c : cases) {
        const auto begun = std::chrono::steady_clock::now();
        const PhoneRun run = Phone(c.arguments, c.input);
        EXPECT_EQ(run.code, 2) << c.arguments;
        EXPECT_NE(Errors().find(c.says), std::string::npos) << c.arguments << ": " << Errors();
        // Refused before any port is opened or any dialer asked.
        EXPECT_LT(std::chrono::steady_clock::now() - begun, 3s) << c.arguments;
    }
    EXPECT_EQ(Array("contacts list --sim").size(), 8);
}

TEST_P(VqmPhoneTest, TwoCommandsAtOnceBothComplete) {
    Start();
    const std::string command = Environment() + VQM_PHONE + " --json contacts list --sim >";
    Background first(command + (temp_ / "first.out") + " 2>&1");
    Background second(command + (temp_ / "second.out") + " 2>&1");
    const int firstCode = first.WaitExit(60s), secondCode = second.WaitExit(60s);
    if (ViaDialer()) {
        // The dialer's port lock orders the two; neither disturbs the other's exchange.
        EXPECT_EQ(firstCode, 0) << ReadFile(temp_ / "first.out");
        EXPECT_EQ(secondCode, 0) << ReadFile(temp_ / "second.out");
    } else {
        // Without a dialer the port is the first one's: the second is told there is no card.
        EXPECT_TRUE(firstCode == 0 || secondCode == 0);
        EXPECT_TRUE(firstCode == 3 || secondCode == 3 || (firstCode == 0 && secondCode == 0));
    }
    for (const char* name : {"first.out", "second.out"}) {
        const std::string output = ReadFile(temp_ / name);
        if (output.find('[') != 0) continue;
        EXPECT_EQ(Parse(output).array().size(), 8) << name;
    }
}

TEST_P(VqmPhoneTest, WithoutACardItSaysSo) {
    // Nothing started: no dialer, no card.
    const PhoneRun run = Phone("status");
    EXPECT_EQ(run.code, 3);
    EXPECT_NE(Errors().find("no card"), std::string::npos) << Errors();
    // The computer's own files need no card.
    EXPECT_EQ(Phone("calllog").code, 0) << Errors();
}

std::string CaseName(const ::testing::TestParamInfo<std::tuple<const char*, bool>>& info) {
    return std::string(std::get<0>(info.param)) + (std::get<1>(info.param) ? "ViaDialer" : "Alone");
}

INSTANTIATE_TEST_SUITE_P(CardsAndDialer, VqmPhoneTest,
                         ::testing::Combine(::testing::Values("card", "standard"),
                                            ::testing::Bool()),
                         CaseName);

}  // namespace
}  // namespace vqm
