// The SMS Folder view in the main window on the offscreen platform, beside the DialPad, with the
// simulated card in-process: the first refresh, new messages from "+CMTI:" to the Inbox, paste
// into each page, delete, open, send, and what Reply and Forward hand to the write view.
#include "messaging/sms_folder_view.h"

#include <gtest/gtest.h>

#include <QAbstractButton>
#include <QApplication>
#include <QLabel>
#include <QTabBar>
#include <QTextEdit>
#include <QTreeWidget>
#include <chrono>
#include <cstring>
#include <filesystem>
#include <thread>

#include "calls/alerts.h"
#include "calls/dial_pad_view.h"
#include "cardsim/card_sim.h"
#include "link/link.h"
#include "messaging/write_sms_view.h"
#include "shell/dialogs.h"
#include "shell/messages.h"
#include "shell/view_factories.h"
#include "support/settings_store.h"
#include "support/text.h"
#include "tests/common/sim_card_host.h"
#include "tests/common/temp_folder.h"
#include "tests/common/wait.h"

namespace vqm {
namespace {

using std::chrono::milliseconds;

using testing::SimCardHost;

constexpr char kKnownNumber[] = "+447700900123";

class SmsFolderViewTest : public ::testing::Test {
  protected:
    SmsFolderViewTest() {
        SetSettingString(settings_, u"InstallPath", Utf8ToUtf16(install_).c_str());
        std::filesystem::create_directories(install_);
        dialogs_.SetResponder([this](const DialogRequest& request) {
            boxes_.push_back(Utf16ToUtf8(request.title + u": " + request.text));
            return kIdOk;
        });
    }
    ~SmsFolderViewTest() override {
        window_.reset();
        PortClose(link_);
    }

    // The card, the program's views, the link open and the card connected; the DialPad shows.
    void Start() {
        cardsim::SimConfig config;
        config.baud = 0;
        config.stateFile = temp_ / "card.state";  // the demo SIM
        sim_ = std::make_unique<cardsim::CardSim>(config);
        ASSERT_TRUE(sim_->PowerUp());
        host_.device = sim_->DevicePath();
        context_.caches = &caches_;
        window_ = std::make_unique<MainWindow>(context_, DefaultViewFactories(), &host_);
        window_->StopWatchTimer();
        host_.messages = &window_->Messages();
        folder_ = dynamic_cast<SmsFolderView*>(window_->ViewAt(kViewSmsFolder));
        pad_ = dynamic_cast<DialPadView*>(window_->ViewAt(kViewDialPad));
        ASSERT_NE(folder_, nullptr);
        ASSERT_NE(pad_, nullptr);
        ASSERT_EQ(host_.OpenLink(), 1);
        window_->Watch().SetCardState(2);
    }
    // Shows the folder and waits for its first refresh.
    void OpenFolder() {
        window_->Command(kCmdViewFirst + kViewSmsFolder);
        ASSERT_TRUE(WaitFor([&] { return folder_->RefreshState() == kFolderRefreshed; }));
    }

    bool WaitFor(const std::function<bool()>& done, int limitMs = 20000) {
        return testing::WaitPumping(done, milliseconds(limitMs));
    }
    QTreeWidget* List(int page) { return folder_->List(page); }
    std::vector<std::string> Column(int page, int column) {
        std::vector<std::string> texts;
        for (int i = 0; i < List(page)->topLevelItemCount(); ++i)
            texts.push_back(List(page)->topLevelItem(i)->text(column).toStdString());
        return texts;
    }
    std::string Caption(int page) {
        auto* tabs = qobject_cast<QTabBar*>(FindControl(folder_, kFolderTabId));
        return tabs ? tabs->tabText(page).toStdString() : "<none>";
    }
    void Select(int page, int row) {
        folder_->SelectPage(page);
        QTreeWidgetItem* item = List(page)->topLevelItem(row);
        ASSERT_NE(item, nullptr);
        List(page)->clearSelection();
        List(page)->setCurrentItem(item);
        item->setSelected(true);
    }
    void Click(int id) {
        auto* button = qobject_cast<QAbstractButton*>(FindControl(folder_, id));
        ASSERT_NE(button, nullptr) << id;
        button->click();
    }
    std::u16string Notice() {
        auto* label = qobject_cast<QLabel*>(FindControl(pad_, kNotificationLineId));
        return label ? label->text().toStdU16String() : u"<none>";
    }
    void KnowContact(const char* number, const char* name) {
        PhonebookEntry entry{};
        entry.index = 1;
        entry.type = 145;
        entry.numberLength = static_cast<int32_t>(std::strlen(number));
        entry.textLength = static_cast<int32_t>(std::strlen(name));
        std::snprintf(entry.number, sizeof entry.number, "%s", number);
        std::snprintf(entry.text, sizeof entry.text, "%s", name);
        FILE* file = std::fopen((install_ + "simphonebk1.db").c_str(), "wb");
        ASSERT_NE(file, nullptr);
        std::fwrite(&entry, sizeof entry, 1, file);
        std::fclose(file);
    }
    std::vector<SmsRecord> Folder(int folder) {
        std::vector<SmsRecord> records;
        StoreReadAll(folder_->Store(), folder, &records);
        return records;
    }
    void Snap(const char* name) {
        const char* dir = std::getenv("VQM_SCREENSHOTS");
        if (!dir) return;  // screenshots only when asked for
        window_->show();
        QApplication::processEvents();
        EXPECT_TRUE(
            window_->grab().save(QString::fromStdString(std::string(dir) + "/" + name + ".png")));
    }

    const testing::TempFolder temp_;
    const std::string install_ = temp_ / "install/";
    SettingsStore settings_{temp_ / "settings.db"};
    Link link_{settings_, DriverRoots{temp_ / "run", temp_ / "tty"}};
    Dialogs dialogs_;
    PhonebookCaches caches_{settings_};
    ShellContext context_{settings_, link_, dialogs_, temp_ / "run"};
    SimCardHost host_{link_};
    std::unique_ptr<cardsim::CardSim> sim_;
    std::unique_ptr<MainWindow> window_;
    SmsFolderView* folder_ = nullptr;
    DialPadView* pad_ = nullptr;
    std::vector<std::string> boxes_;
};

TEST(NewMessageLine, LocationFollowsTheQuotedMemoryName) {
    struct Case {
        const char* line;
        int location;
        const char* memory;
    };
    const Case cases[] = {
        {"+CMTI: \"SM\",5", 5, "SM"}, {"+CMTI: \"SM\",12\r", 12, "SM"},
        {"+CMTI: \"SM\"", -1, "SM"},  {"+CMTI: \"SM\" ,3", -1, "SM"},
        {"+CMTI: SM,3", -1, ""},      {"+CMTI:", -1, ""},
        {"+CMTI: \"SM\",", -1, "SM"},
    };
    for (const Case& c : cases) {
        EventRecord record{};
        record.length = static_cast<uint8_t>(std::strlen(c.line));
        std::memcpy(record.text, c.line, static_cast<size_t>(record.length));
        char memory[8] = "x";
        EXPECT_EQ(NewMessageLocation(record, memory, sizeof memory), c.location) << c.line;
        if (record.length >= 7) {
            EXPECT_STREQ(memory, c.memory) << c.line;
        }
    }
}

TEST_F(SmsFolderViewTest, FirstShowRefreshesTheSimAndAnOpenedMessageIsRead) {
    KnowContact(kKnownNumber, "Alice");
    Start();
    OpenFolder();
    // The demo SIM: three received messages and one waiting to be sent.
    EXPECT_EQ(List(kPageInbox)->topLevelItemCount(), 3);
    EXPECT_EQ(List(kPageOutbox)->topLevelItemCount(), 1);
    EXPECT_EQ(Column(kPageInbox, kColumnMemory), (std::vector<std::string>(3, "SIM")));
    EXPECT_EQ(Caption(kPageInbox), "Inbox(1)");
    EXPECT_EQ(Caption(kPageOutbox), "Outbox(0)");
    EXPECT_EQ(Caption(kPageDraft), "Draft");
    // Newest first; the known number shows its name; the unread one is selected, still unread.
    EXPECT_EQ(Column(kPageInbox, kColumnDate),
              (std::vector<std::string>{"18:02:51,21/03/2002", "14:25:36,11/03/2002",
                                        "09:00:00,11/03/2002"}));
    EXPECT_EQ(Column(kPageInbox, kColumnFrom),
              (std::vector<std::string>{"6977654321", "+306944123456", "Alice"}));
    ASSERT_NE(List(kPageInbox)->currentItem(), nullptr);
    EXPECT_EQ(List(kPageInbox)->currentItem()->text(kColumnFrom), "Alice");
    EXPECT_FALSE(List(kPageInbox)->currentItem()->icon(kColumnFrom).isNull());
    EXPECT_EQ(folder_->Pane(kPageInbox)->toPlainText(),
              "Meeting moved to 15:30, see you   the office");  // '@' is GSM code 0: a blank
    const int unreadAt = folder_->Rows(kPageInbox)[2].record.index;
    EXPECT_EQ(IndexListContains(settings_, kUnreadIdx, unreadAt), 1);
    Snap("sms-inbox");

    // The Greek message is UCS2 on the SIM.
    Select(kPageInbox, 0);
    EXPECT_EQ(folder_->Pane(kPageInbox)->toPlainText().toStdU16String(),
              u"Καλημέρα! Τα λέμε αύριο;");

    // The user opening it makes it read in the cache and takes it out of "UnreadIdx".
    Select(kPageInbox, 2);
    EXPECT_EQ(Caption(kPageInbox), "Inbox(0)");
    EXPECT_EQ(IndexListContains(settings_, kUnreadIdx, unreadAt), 0);
    for (const SmsRecord& record : Folder(kFolderSim)) {
        if (record.index == unreadAt) {
            EXPECT_STREQ(record.status, "REC READ");
        }
    }
    folder_->Reload();
    EXPECT_EQ(Caption(kPageInbox), "Inbox(0)");
}

TEST_F(SmsFolderViewTest, ANewMessageIsAnnouncedOnTheDialPadAndTakenIntoTheInboxOnTap) {
    KnowContact(kKnownNumber, "Alice");
    Start();
    OpenFolder();
    window_->ShowDialPad();

    ASSERT_EQ(sim_->Control(std::string("deliver ") + kKnownNumber + " Hello"), "OK");
    ASSERT_TRUE(WaitFor([&] { return Notice() == u"2 new SMS" || Notice() == u"1 new SMS"; }))
        << Utf16ToUtf8(Notice());
    EXPECT_EQ(window_->Views().current, kViewDialPad);
    EXPECT_EQ(IndexListContains(settings_, kNewIdx, 5), 1);

    // The tap (or the desktop notification's action) opens the folder, which takes it in.
    window_->Command(kCmdNotificationTapped);
    ASSERT_TRUE(WaitFor([&] { return IndexListCount(settings_, kNewIdx) == 0; }));
    EXPECT_EQ(window_->Views().current, kViewSmsFolder);
    EXPECT_EQ(folder_->CurrentPage(), kPageInbox);
    ASSERT_EQ(List(kPageInbox)->topLevelItemCount(), 4);
    QTreeWidgetItem* selected = List(kPageInbox)->currentItem();
    ASSERT_NE(selected, nullptr);
    EXPECT_EQ(selected->text(kColumnFrom), "Alice");
    EXPECT_EQ(selected->text(kColumnMessage), "Hello");
    EXPECT_FALSE(selected->icon(kColumnFrom).isNull());
    EXPECT_EQ(folder_->Pane(kPageInbox)->toPlainText(), "Hello");
    EXPECT_EQ(Notice(), u"");
    // Taken in once: the transfer file is gone and the location is listed once.
    EXPECT_EQ(ClipboardCount(folder_->Store()), 0);
    int copies = 0;
    for (const SmsRecord& record : Folder(kFolderSim))
        copies += record.index == 5;
    EXPECT_EQ(copies, 1);
}

TEST_F(SmsFolderViewTest, AMessageThatFillsTheSimIsAnnouncedBesideSimFull) {
    Start();
    ASSERT_EQ(sim_->Control("capacity 5"), "OK");
    ASSERT_EQ(sim_->Control("deliver +4412 The last place"), "OK");
    ASSERT_TRUE(WaitFor([&] { return Notice().find(u"new SMS") != std::u16string::npos; }))
        << Utf16ToUtf8(Notice());
    const std::u16string notice = Notice();
    EXPECT_EQ(notice.substr(notice.size() - 9), u"/SIM Full") << Utf16ToUtf8(notice);
    // The card refuses what does not fit: no "+CMTI:", nothing more noted.
    EXPECT_NE(sim_->Control("deliver +4412 No room"), "OK");
    EXPECT_EQ(IndexListCount(settings_, kNewIdx), 1);
}

TEST_F(SmsFolderViewTest, LosingTheCardEmptiesTheSimPagesAndTheNextShowRefreshesAgain) {
    Start();
    OpenFolder();
    ASSERT_EQ(List(kPageInbox)->topLevelItemCount(), 3);
    window_->Watch().SetCardState(1);
    EXPECT_EQ(folder_->RefreshState(), kFolderNotRefreshed);
    EXPECT_EQ(List(kPageInbox)->topLevelItemCount(), 0);
    EXPECT_FALSE(std::filesystem::exists(install_ + "smsmsg1.db"));
    auto* reply = qobject_cast<QAbstractButton*>(FindControl(folder_, kFolderReplyFirstId));
    ASSERT_NE(reply, nullptr);
    EXPECT_FALSE(reply->isEnabled());

    ASSERT_EQ(host_.OpenLink(), 1);
    window_->Watch().SetCardState(2);
    EXPECT_TRUE(reply->isEnabled());
    window_->ShowDialPad();
    OpenFolder();
    EXPECT_EQ(List(kPageInbox)->topLevelItemCount(), 3);
}

TEST_F(SmsFolderViewTest, PasteFilesTheTransferFileIntoThePageShowing) {
    Start();
    OpenFolder();
    struct Case {
        int page;
        const char* status;  // as filed
        const char* memory;
        bool keepsNumber;
    };
    const Case cases[] = {
        {kPageOutbox, "STO UNSENT", "SIM", true},
        {kPageSent, "STO SENT", "PDA", true},
        {kPageDraft, "PDA DRAFT", "PDA", false},
        {kPagePda, "PDA PDA", "PDA", true},
    };
    for (const Case& c : cases) {
        SmsRecord record{};
        std::snprintf(record.number, sizeof record.number, "+30210555");
        std::snprintf(record.status, sizeof record.status, "STO SENT");
        std::snprintf(record.date, sizeof record.date, "10:00:00,01/02/2030");
        std::snprintf(record.text, sizeof record.text, "Pasted %d", c.page);
        record.length = static_cast<int32_t>(std::strlen(record.text));
        ASSERT_EQ(ClipboardAppend(folder_->Store(), record), 1);
        const int before = List(c.page)->topLevelItemCount();
        folder_->SelectPage(c.page);
        folder_->Paste();
        ASSERT_EQ(List(c.page)->topLevelItemCount(), before + 1) << c.page;
        EXPECT_EQ(ClipboardCount(folder_->Store()), 0);
        const FolderRow* pasted = nullptr;
        for (const FolderRow& row : folder_->Rows(c.page))
            if (row.preview == Utf8ToUtf16(record.text)) pasted = &row;
        ASSERT_NE(pasted, nullptr) << c.page;
        EXPECT_STREQ(pasted->record.status, c.status);
        EXPECT_EQ(pasted->folder == kFolderSim ? "SIM" : "PDA", std::string(c.memory));
        EXPECT_EQ(pasted->record.number[0] != '\0', c.keepsNumber) << c.page;
    }
    EXPECT_TRUE(boxes_.empty());
    // The Outbox paste was written to the SIM: a fresh refresh finds it there.
    int32_t used = 0, total = 0;
    ASSERT_EQ(SmsSelectSimStorage(link_, &used, &total), 1);
    EXPECT_EQ(used, 5);
    for (int page : {kPageOutbox, kPageSent, kPageDraft, kPagePda}) {
        folder_->SelectPage(page);
        Select(page, 0);
        Snap(("sms-page-" + std::to_string(page)).c_str());
    }

    // A full SIM refuses an Outbox paste.
    ASSERT_EQ(sim_->Control("capacity 5"), "OK");
    SmsRecord record{};
    std::snprintf(record.text, sizeof record.text, "No room");
    record.length = 7;
    ASSERT_EQ(ClipboardAppend(folder_->Store(), record), 1);
    folder_->SelectPage(kPageOutbox);
    folder_->Paste();
    EXPECT_EQ(boxes_, std::vector<std::string>{"Error!: Cannot paste message."});
    EXPECT_EQ(List(kPageOutbox)->topLevelItemCount(), 2);
}

TEST_F(SmsFolderViewTest, DeleteRemovesSimMessagesFromTheCardAndPdaOnesFromTheFolder) {
    Start();
    SmsRecord kept{};
    kept.index = 1;
    std::snprintf(kept.status, sizeof kept.status, "PDA PDA");
    std::snprintf(kept.text, sizeof kept.text, "Kept here");
    kept.length = 9;
    ASSERT_EQ(StoreAppend(folder_->Store(), kFolderLocal, kept), 1);
    OpenFolder();
    ASSERT_EQ(List(kPagePda)->topLevelItemCount(), 1);

    Select(kPagePda, 0);
    Click(kFolderDeleteFirstId + kPagePda);
    EXPECT_EQ(List(kPagePda)->topLevelItemCount(), 0);
    EXPECT_TRUE(Folder(kFolderLocal).empty());

    Select(kPageInbox, 0);
    const int location = folder_->Rows(kPageInbox)[0].record.index;
    Click(kFolderDeleteFirstId + kPageInbox);
    EXPECT_EQ(List(kPageInbox)->topLevelItemCount(), 2);
    SmsRecord gone{};
    gone.index = location;
    EXPECT_EQ(SmsRead(link_, kSmsModePdu, &gone), 0);
    EXPECT_EQ(IndexListContains(settings_, kUnreadIdx, location), 0);
    EXPECT_TRUE(boxes_.empty());

    // Without the card a SIM message cannot go: the box, and the message stays listed.
    PortClose(link_);
    Select(kPageInbox, 0);
    Click(kFolderDeleteFirstId + kPageInbox);
    EXPECT_EQ(boxes_, std::vector<std::string>{"Error!: Cannot delete message."});
    EXPECT_EQ(List(kPageInbox)->topLevelItemCount(), 2);
}

// A script through the dialer's socket: the Inbox's list id selects all its rows, its Delete
// then deletes them from the card; a hidden page's button is not taken.
TEST_F(SmsFolderViewTest, CommandsFromOutsideSelectAPagesRowsAndClickItsButtons) {
    Start();
    OpenFolder();
    const std::vector<FolderRow> rows = folder_->Rows(kPageInbox);
    ASSERT_GE(rows.size(), 2u);
    folder_->SelectPage(kPagePda);
    window_->Command(kFolderDeleteFirstId + kPageInbox);  // the Inbox is not in front
    EXPECT_EQ(List(kPageInbox)->topLevelItemCount(), static_cast<int>(rows.size()));

    window_->Command(kFolderListFirstId + kPageInbox);
    EXPECT_EQ(List(kPageInbox)->selectedItems().size(), static_cast<int>(rows.size()));
    window_->Command(kFolderDeleteFirstId + kPageInbox);
    EXPECT_EQ(List(kPageInbox)->topLevelItemCount(), 0);
    for (const SmsRecord& record : Folder(kFolderSim))  // the Outbox's stay
        EXPECT_NE(std::string(record.status).rfind("REC", 0), 0u) << record.index;
    for (const FolderRow& row : rows) {
        SmsRecord gone{};
        gone.index = row.record.index;
        EXPECT_EQ(SmsRead(link_, kSmsModePdu, &gone), 0) << row.record.index;
    }
    EXPECT_TRUE(boxes_.empty());
}

TEST_F(SmsFolderViewTest, ReplyAndForwardHandTheirTextToTheWriteViewAndSendFilesTheSentCopy) {
    KnowContact(kKnownNumber, "Alice");
    Start();
    OpenFolder();
    Select(kPageInbox, 2);
    Click(kFolderReplyFirstId + kPageInbox);
    EXPECT_EQ(window_->Views().current, kViewWriteSms);
    auto* write = dynamic_cast<WriteSmsView*>(window_->ViewAt(kViewWriteSms));
    ASSERT_NE(write, nullptr);
    EXPECT_EQ(write->Recipients(), u"Alice<+447700900123>;\n");  // the box's line break
    EXPECT_EQ(write->Text(), u"");

    window_->Command(kCmdViewFirst + kViewSmsFolder);
    Select(kPageInbox, 0);
    Click(kFolderForwardFirstId + kPageInbox);
    EXPECT_EQ(window_->Views().current, kViewWriteSms);
    EXPECT_EQ(write->Recipients(), u"");  // a new message
    EXPECT_EQ(write->Text(), u"Καλημέρα! Τα λέμε αύριο;");

    // The Outbox's stored message goes out and its copy is kept as sent, on the handheld.
    window_->Command(kCmdViewFirst + kViewSmsFolder);
    Select(kPageOutbox, 0);
    Click(kFolderReplyFirstId + kPageOutbox);
    EXPECT_EQ(boxes_, std::vector<std::string>{"VQM Dialer: Message has been sent."});
    ASSERT_EQ(List(kPageSent)->topLevelItemCount(), 1);
    EXPECT_EQ(List(kPageSent)->topLevelItem(0)->text(kColumnMemory), "PDA");
    EXPECT_EQ(List(kPageSent)->topLevelItem(0)->text(kColumnMessage), "Call the bank tomorrow");
    Snap("sms-sent");
}

}  // namespace
}  // namespace vqm
