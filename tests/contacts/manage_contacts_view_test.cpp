// The Manage Contacts view offscreen against the simulated card: the load on activation with
// the geometry learnt, New, Edit, Copy To and Delete reaching both the card and the lists, the
// dialogs' checks as a person meets them, Make Call and Write Message hand-overs, Find, the
// address-book pages from a vCard folder, vCard import and export, and a screenshot of each
// page and dialog.
#include "contacts/manage_contacts_view.h"

#include <gtest/gtest.h>

#include <QAction>
#include <QApplication>
#include <QLabel>
#include <QLineEdit>
#include <QMenu>
#include <QPushButton>
#include <QTreeWidget>
#include <chrono>
#include <condition_variable>
#include <deque>
#include <filesystem>
#include <fstream>
#include <functional>
#include <memory>
#include <mutex>
#include <thread>

#include "cardsim/card_sim.h"
#include "contacts/phonebook_at.h"
#include "link/link.h"
#include "shell/card_watch.h"
#include "shell/dialogs.h"
#include "shell/messages.h"
#include "support/settings_store.h"
#include "support/text.h"
#include "tests/common/link_waits.h"
#include "tests/common/temp_folder.h"
#include "tests/common/wait.h"

namespace vqm {
namespace {

namespace fs = std::filesystem;

// Pictures of what a person sees, in the build's screenshot folder. A dialog or box sizes
// itself when shown.
void Shoot(QWidget* widget, const std::string& name) {
    const std::string folder = VQM_SCREENSHOT_DIR;
    fs::create_directories(folder);
    const bool shown = widget->isVisible();
    if (!shown) widget->show();
    QApplication::processEvents();
    EXPECT_TRUE(widget->grab().save(QString::fromStdString(folder + "/" + name + ".png"))) << name;
    if (!shown) widget->hide();
}

class ManageContactsViewTest : public ::testing::Test {
  protected:
    ManageContactsViewTest() {
        SetSettingString(settings_, u"InstallPath",
                         std::u16string(temp_.Path().begin(), temp_.Path().end()).c_str());
        // No desktop address book of the machine's user: an empty folder unless a test fills it.
        fs::create_directories(temp_ / "cards");
        const std::string cards = temp_ / "cards";
        SetSettingString(settings_, kContactsFolderSetting,
                         std::u16string(cards.begin(), cards.end()).c_str());
        caches_.pause = [](int) {};
        cardsim::SimConfig config;
        config.baud = 0;
        config.runtimeDir = temp_ / "sim";
        config.stateFile = temp_ / "card.state";
        sim_ = std::make_unique<cardsim::CardSim>(config);
        EXPECT_TRUE(sim_->PowerUp());
        testing::ShortenLinkWaits(link_);
        EXPECT_EQ(PortOpenDevice(link_, sim_->DevicePath().c_str()), 1);
        dialogs_.SetResponder([this](const DialogRequest& request) {
            if (!request.isDialog) {
                boxes_.push_back(request.text);
                if (request.box && !boxShot_.empty()) Shoot(request.box, boxShot_);
                boxShot_.clear();
                return kIdOk;
            }
            if (answers_.empty()) return kIdCancel;
            auto answer = std::move(answers_.front());
            answers_.pop_front();
            return answer(*static_cast<ContactDialog*>(request.dialog));
        });
        // The main window's size: the view takes it less the menu bar.
        host_.resize(240, 320);
    }
    ~ManageContactsViewTest() override {
        delete view_;
        PortClose(link_);
    }

    ManageContactsView& Make() {
        view_ = new ManageContactsView(
            &host_, context_, &caches_,
            [this](const std::u16string& number) {
                dialled_.push_back(number);
                return 1;
            },
            [this](const std::u16string& text) { handed_.push_back(text); });
        view_->SetCardStateSource([this] { return cardState_; });
        host_.show();
        return *view_;
    }
    // Shows the view and waits for the SIM lists (at most 30 s).
    ManageContactsView& MakeLoaded() {
        ManageContactsView& view = Make();
        view.OnMessage(kMsgViewShown, 0, 0);
        EXPECT_TRUE(WaitUntil([&] { return view.LoadState().sim == 2; }));
        return view;
    }
    static bool WaitUntil(const std::function<bool()>& done) {
        return testing::WaitPumping(done, std::chrono::seconds(30));
    }
    // The next dialog is answered by filling its fields and pressing OK (or Cancel).
    void Fill(const QString& name, const QString& number, int answer = kIdOk) {
        answers_.push_back([name, number, answer](ContactDialog& dialog) {
            dialog.Name()->setText(name);
            dialog.Number()->setText(number);
            return answer;
        });
    }
    std::vector<std::string> Names(int page) const {
        std::vector<std::string> out;
        QTreeWidget* list = view_->List(page);
        for (int i = 0; i < list->topLevelItemCount(); ++i)
            out.push_back(list->topLevelItem(i)->text(kContactsColumnName).toStdString());
        return out;
    }
    QTreeWidgetItem* Select(int page, const std::string& name) {
        view_->ShowPage(page);
        QTreeWidget* list = view_->List(page);
        list->clearSelection();
        for (int i = 0; i < list->topLevelItemCount(); ++i) {
            QTreeWidgetItem* item = list->topLevelItem(i);
            if (item->text(kContactsColumnName).toStdString() != name) continue;
            list->setCurrentItem(item);
            item->setSelected(true);
            return item;
        }
        return nullptr;
    }
    // The card's own entry at index in storage, read over the link.
    PhonebookEntry CardEntry(const char* storage, int index) {
        PhonebookSelect(link_, PhonebookStorageIndex(storage));
        PhonebookEntry entry{};
        PhonebookReadEntry(link_, index, &entry);
        return entry;
    }

    const testing::TempFolder temp_;
    SettingsStore settings_{temp_ / "settings.db"};
    Link link_{settings_, DriverRoots{temp_ / "run", temp_ / "tty"}};
    Dialogs dialogs_;
    ShellContext context_{settings_, link_, dialogs_, temp_ / "run"};
    PhonebookCaches caches_{settings_};
    std::unique_ptr<cardsim::CardSim> sim_;
    QWidget host_;
    ManageContactsView* view_ = nullptr;
    int cardState_ = 2;
    std::deque<std::function<int(ContactDialog&)>> answers_;
    std::vector<std::u16string> boxes_, dialled_, handed_;
    std::string boxShot_;  // the name of a picture to take of the next box
};

TEST_F(ManageContactsViewTest, ActivationListsTheDemoSimAndLearnsTheGeometry) {
    ManageContactsView& view = MakeLoaded();
    const std::vector<std::string> sim = Names(kContactsSimPage);
    ASSERT_EQ(sim.size(), 8u);
    EXPECT_EQ(sim.front(), "Alice Smith");  // sorted by name
    EXPECT_EQ(sim[2].substr(0, 4), "Chlo");
    EXPECT_FALSE(Names(kContactsCardPage).empty());
    QTreeWidget* list = view.List(kContactsSimPage);
    EXPECT_TRUE(list->isColumnHidden(kContactsColumnStorage));
    EXPECT_EQ(list->topLevelItem(0)->text(kContactsColumnStorage), "SM");
    EXPECT_EQ(list->topLevelItem(0)->text(kContactsColumnIndex), "1");
    const StorageLimits limits = ReadStorageLimits(settings_, "SM");
    EXPECT_EQ(limits.numberLength, 20);
    EXPECT_EQ(limits.textLength, 18);
    EXPECT_EQ(limits.total, 250);
    EXPECT_EQ(ReadStorageLimits(settings_, "ME").total, 100);
    // The card going away empties the SIM lists.
    cardState_ = 1;
    view.OnMessage(kMsgCardStateChanged, 0, 0);
    EXPECT_TRUE(Names(kContactsSimPage).empty());
}

TEST_F(ManageContactsViewTest, NewEditCopyAndDeleteReachTheCardAndTheLists) {
    ManageContactsView& view = MakeLoaded();
    view.ShowPage(kContactsSimPage);
    Fill("Zed Test", "+4930123");
    view.Command(kCmdContactNew);
    EXPECT_TRUE(boxes_.empty());
    PhonebookEntry written = CardEntry("SM", 9);  // the first free place after the demo's 8
    EXPECT_STREQ(written.text, "Zed Test");
    EXPECT_EQ(written.type, 145);
    EXPECT_EQ(Names(kContactsSimPage).back(), "Zed Test");

    // The new contact is the row chosen; a menu command from outside acts on it.
    QTreeWidgetItem* current = view.List(kContactsSimPage)->currentItem();
    ASSERT_NE(current, nullptr);
    EXPECT_EQ(current->text(kContactsColumnName), "Zed Test");
    EXPECT_EQ(view.List(kContactsSimPage)->selectedItems().size(), 1);
    Fill("Zed Edited", "030123");
    view.OnMessage(kWmCommand, kCmdContactEdit, 0);
    written = CardEntry("SM", 9);
    EXPECT_STREQ(written.text, "Zed Edited");
    EXPECT_EQ(written.type, 129);
    char16_t name[40];
    ASSERT_EQ(SimCacheFindName(caches_.sim, "030123", name, 40), 1);
    EXPECT_EQ(std::u16string(name), u"Zed Edited");

    ASSERT_NE(Select(kContactsSimPage, "Zed Edited"), nullptr);
    const size_t cardRows = Names(kContactsCardPage).size();
    view.Command(kCmdContactCopyToCard);
    ASSERT_EQ(Names(kContactsCardPage).size(), cardRows + 1);
    EXPECT_STREQ(CardEntry("ME", static_cast<int>(cardRows) + 1).text, "Zed Edited");

    // Delete takes every selected row.
    view.ShowPage(kContactsSimPage);
    QTreeWidget* list = view.List(kContactsSimPage);
    Select(kContactsSimPage, "Zed Edited");
    Select(kContactsSimPage, "Alice Smith");
    list->topLevelItem(0)->setSelected(true);
    for (int i = 0; i < list->topLevelItemCount(); ++i)
        if (list->topLevelItem(i)->text(0) == "Zed Edited")
            list->topLevelItem(i)->setSelected(true);
    view.Command(kCmdContactDelete);
    EXPECT_EQ(Names(kContactsSimPage).size(), 7u);
    EXPECT_EQ(CardEntry("SM", 9).numberLength, 0);
    EXPECT_EQ(CardEntry("SM", 1).numberLength, 0);
    EXPECT_TRUE(boxes_.empty());
}

// Holds the thread that calls Hold until Open (at most 30 s).
struct Gate {
    void Hold() {
        std::unique_lock<std::mutex> lock(mutex);
        held = true;
        changed.notify_all();
        changed.wait_for(lock, std::chrono::seconds(30), [this] { return open; });
    }
    bool WaitHeld() {
        std::unique_lock<std::mutex> lock(mutex);
        return changed.wait_for(lock, std::chrono::seconds(30), [this] { return held; });
    }
    void Open() {
        std::lock_guard<std::mutex> lock(mutex);
        open = true;
        changed.notify_all();
    }
    std::mutex mutex;
    std::condition_variable changed;
    bool held = false, open = false;
};

// New, Copy To and Import take the first free place the cache shows; while the cache is not
// read yet, or is being rebuilt, it shows none taken, and place 1 on the card (Alice's) would be
// overwritten. Each is refused with its own message until the lists are whole again.
TEST_F(ManageContactsViewTest, NothingTakesAFreePlaceWhileTheListsAreRead) {
    const std::string cardOne = CardEntry("ME", 1).text;
    ASSERT_FALSE(cardOne.empty());
    ManageContactsView& view = Make();  // not shown yet: nothing read
    int vcardAsked = 0;
    view.SetVCardPathSource([&](bool) {
        ++vcardAsked;
        return std::string(temp_ / "absent.vcf");
    });
    auto refusedCommands = [&](const char* when) {
        SCOPED_TRACE(when);
        boxes_.clear();
        answers_.clear();
        Fill("Zed Test", "+4930123");
        view.ShowPage(kContactsSimPage);
        view.Command(kCmdContactNew);
        view.Command(kCmdContactImport);
        Select(kContactsSimPage, "Bob Jones");
        view.Command(kCmdContactCopyToCard);
        EXPECT_EQ(boxes_, std::vector<std::u16string>(3, kContactsStillReadingText));
        EXPECT_EQ(answers_.size(), 1u);  // no dialog was opened
        EXPECT_EQ(vcardAsked, 0);
        EXPECT_STREQ(CardEntry("SM", 1).text, "Alice Smith");
        EXPECT_EQ(std::string(CardEntry("ME", 1).text), cardOne);
        // Greyed where a person would choose them.
        QMenu* menu = view.PrepareMenu(kContactsSimPage, QPoint(-5, -5));
        for (QAction* action : menu->actions()) {
            const int id = action->data().toInt();
            if (id == kCmdContactNew || id == kCmdContactCopyToCard || id == kCmdContactImport) {
                EXPECT_FALSE(action->isEnabled()) << id;
            }
            if (id == kCmdContactRefresh || id == kCmdContactExport) {
                EXPECT_TRUE(action->isEnabled()) << id;
            }
        }
        EXPECT_FALSE(view.FileMenuEntries().front().enabled);
    };
    refusedCommands("before the first load");

    // Loaded: then a Refresh whose builder is held after the SIM's book, with the cache's
    // write state its own and the Card Phone's file not read yet.
    view.OnMessage(kMsgViewShown, 0, 0);
    ASSERT_TRUE(WaitUntil([&] { return view.LoadState().sim == 2; }));
    auto gate = std::make_shared<Gate>();  // shared: the builder may outlive a failed test
    caches_.pause = [gate](int) { gate->Hold(); };
    const std::unique_ptr<Gate, void (*)(Gate*)> opened(gate.get(), [](Gate* g) { g->Open(); });
    view.ShowPage(kContactsSimPage);
    view.Command(kCmdContactRefresh);
    ASSERT_TRUE(gate->WaitHeld());
    refusedCommands("during a rebuild");
    gate->Open();
    ASSERT_TRUE(WaitUntil([&] { return view.LoadState().sim == 2 && !caches_.workers.Busy(); }));

    // A build another view started (the picker's load finding no cache) while this one's lists
    // stand loaded.
    auto other = std::make_shared<Gate>();
    caches_.pause = [other](int) { other->Hold(); };
    const std::unique_ptr<Gate, void (*)(Gate*)> otherOpened(other.get(),
                                                             [](Gate* g) { g->Open(); });
    CacheDeleteFiles(caches_.sim);
    SimCacheLoad(caches_, link_, {});
    ASSERT_TRUE(other->WaitHeld());
    ASSERT_EQ(view.LoadState().sim, 2);
    refusedCommands("during another view's build");
    other->Open();
    ASSERT_TRUE(WaitUntil([&] { return !caches_.workers.Busy(); }));
    EXPECT_EQ(std::string(CardEntry("ME", 1).text), cardOne);

    // Read whole again: New takes the first place the card leaves free.
    boxes_.clear();
    answers_.clear();
    Fill("Zed Test", "+4930123");
    view.ShowPage(kContactsSimPage);
    view.Command(kCmdContactNew);
    EXPECT_TRUE(boxes_.empty());
    EXPECT_STREQ(CardEntry("SM", 9).text, "Zed Test");
    EXPECT_STREQ(CardEntry("SM", 1).text, "Alice Smith");
}

TEST_F(ManageContactsViewTest, TheDialogRefusesUntilTheFieldsFit) {
    ManageContactsView& view = MakeLoaded();
    view.ShowPage(kContactsSimPage);
    Fill(QString(19, 'n'), "123");  // one past the SIM's 18
    Fill(QString::fromUtf16(u"Chlo\u00E9"), "123");
    Fill("Fits", "123456789012345678901");  // one past 20 digits
    Fill("Fits", "12345678901234567890");
    view.Command(kCmdContactNew);
    EXPECT_EQ(boxes_, (std::vector<std::u16string>{
                          u"Contact name cannot longer than 18 characters.",
                          u"Contact name cannot have non-English characters.\n\"\u00E9\" (U+00E9) "
                          u"cannot be stored.",
                          u"Contact number cannot more than 20 digits."}));
    EXPECT_STREQ(CardEntry("SM", 9).text, "Fits");

    // Cancel writes nothing; an unchanged refused answer ends the dialog too.
    boxes_.clear();
    Fill("Other", "1", kIdCancel);
    view.Command(kCmdContactNew);
    Fill(QString(19, 'n'), "1");
    Fill(QString(19, 'n'), "1");
    view.Command(kCmdContactNew);
    EXPECT_EQ(CardEntry("SM", 10).numberLength, 0);
    EXPECT_EQ(boxes_.size(), 2u);

    // A full book says so before any dialog.
    boxes_.clear();
    PhonebookSaveGeometry(settings_, "sm", 20, 18, 9);
    view.Command(kCmdContactNew);
    EXPECT_EQ(boxes_, std::vector<std::u16string>{u"The phonebook memory is full."});
}

TEST_F(ManageContactsViewTest, CopyOffersToCutWhatDoesNotFit) {
    ManageContactsView& view = MakeLoaded();
    // The SIM's "Chloé Martin" cannot go to the Card Phone as it is.
    PhonebookSaveGeometry(settings_, "me", 30, 5, 100);
    view.ShowPage(kContactsSimPage);
    QTreeWidget* list = view.List(kContactsSimPage);
    Select(kContactsSimPage, "Bob Jones");
    for (int i = 0; i < list->topLevelItemCount(); ++i)
        if (list->topLevelItem(i)->text(0).startsWith("Chlo"))
            list->topLevelItem(i)->setSelected(true);
    std::vector<std::pair<QString, QString>> offered;  // reason, prefilled name
    answers_.push_back([&](ContactDialog& dialog) {
        offered.emplace_back(qobject_cast<QLabel*>(FindControl(&dialog, kContactReasonId))->text(),
                             dialog.Name()->text());
        return kIdOk;  // "Bob J" fits
    });
    answers_.push_back([&](ContactDialog& dialog) {
        offered.emplace_back(qobject_cast<QLabel*>(FindControl(&dialog, kContactReasonId))->text(),
                             dialog.Name()->text());
        dialog.Name()->setText("Chloe");
        return kIdOk;
    });
    const size_t before = Names(kContactsCardPage).size();
    view.Command(kCmdContactCopyToCard);
    ASSERT_EQ(offered.size(), 2u);
    EXPECT_EQ(offered[0].first.toStdString(),
              "Due to SIM Card and Card Phone memory limitation, the contact name and number "
              "will be truncated.");
    EXPECT_EQ(offered[0].second, "Bob J");
    EXPECT_EQ(offered[1].first, "Contact name cannot have non-English characters.");
    EXPECT_EQ(Names(kContactsCardPage).size(), before + 2);
    // A Cancel stops the copy there.
    answers_.push_back([](ContactDialog&) { return kIdCancel; });
    view.ShowPage(kContactsSimPage);
    view.Command(kCmdContactCopyToCard);
    EXPECT_EQ(Names(kContactsCardPage).size(), before + 2);
}

TEST_F(ManageContactsViewTest, CallMessageAndFind) {
    ManageContactsView& view = MakeLoaded();
    ASSERT_NE(Select(kContactsSimPage, "Bob Jones"), nullptr);
    view.Command(kCmdContactCall);
    view.Command(kCmdContactMessage);
    EXPECT_EQ(dialled_, std::vector<std::u16string>{u"+447700900456"});
    EXPECT_EQ(handed_, std::vector<std::u16string>{u"Bob Jones<+447700900456>;\r\n"});

    // Menu: greyed by page kind and card state.
    QMenu* menu = view.PrepareMenu(kContactsSimPage, QPoint(-5, -5));
    std::vector<int> ids;
    for (QAction* action : menu->actions())
        if (!action->isSeparator()) ids.push_back(action->data().toInt());
    EXPECT_EQ(ids, (std::vector<int>{40021, 40015, 40019, 40028, 40011, 40013, 40023,
                                     kCmdContactImport, kCmdContactExport}));

    auto* find = qobject_cast<QLineEdit*>(FindControl(&view, kContactsFindEditId));
    auto* button = qobject_cast<QPushButton*>(FindControl(&view, kContactsFindButtonId));
    view.ShowPage(kContactsSimPage);
    QTreeWidget* list = view.List(kContactsSimPage);
    find->setText("o");  // every name longer than "o" that holds one
    std::vector<std::string> hits;
    for (int i = 0; i < 3; ++i) {
        button->click();
        hits.push_back(list->currentItem()->text(0).toStdString());
    }
    EXPECT_EQ(hits, (std::vector<std::string>{"Bob Jones", "Chlo\xC3\xA9 Martin", "David Brown"}));
    find->setText("a long note about Emma Wilson and more");  // holds a whole name
    button->click();
    EXPECT_EQ(list->currentItem()->text(0), "Emma Wilson");
}

TEST_F(ManageContactsViewTest, AddressBookPagesFromAVCardFolder) {
    std::ofstream(temp_ / "cards/people.vcf")
        << "BEGIN:VCARD\r\nVERSION:3.0\r\nFN:Greta Holm\r\nTEL;TYPE=CELL:+46 70 555 01\r\n"
           "TEL;TYPE=HOME:08 555 02\r\nEND:VCARD\r\n"
           "BEGIN:VCARD\r\nVERSION:3.0\r\nFN:Fax Firm\r\nTEL;TYPE=WORK,FAX:08 555 09\r\n"
           "END:VCARD\r\n"
           "BEGIN:VCARD\r\nVERSION:3.0\r\nFN:Ivo Work\r\nTEL;TYPE=WORK:08 555 03\r\nEND:VCARD\r\n";
    ManageContactsView& view = MakeLoaded();
    view.ShowPage(kContactsMobilePage);
    view.Command(kCmdContactRefresh);
    ASSERT_TRUE(
        WaitUntil([&] { return view.LoadState().outlook == 2 && !caches_.workers.Busy(); }));
    EXPECT_EQ(Names(kContactsMobilePage), std::vector<std::string>{"Greta Holm"});
    EXPECT_EQ(Names(kContactsHomePage), std::vector<std::string>{"Greta Holm"});
    // The fax-only contact is in the work file but not listed: only first numbers are.
    EXPECT_EQ(Names(kContactsWorkPage), std::vector<std::string>{"Ivo Work"});
    EXPECT_EQ(view.List(kContactsMobilePage)->topLevelItem(0)->text(1), "+467055501");
    char16_t name[140];
    ASSERT_EQ(FindNameByNumber(caches_, "0855502", name, 140), 1);
    EXPECT_EQ(std::u16string(name), u"Greta Holm");

    // Copy To SIM Card from an address-book page.
    Select(kContactsMobilePage, "Greta Holm");
    view.Command(kCmdContactCopyToSim);
    EXPECT_STREQ(CardEntry("SM", 9).text, "Greta Holm");
    EXPECT_EQ(CardEntry("SM", 9).type, 145);
}

TEST_F(ManageContactsViewTest, VCardExportAndImport) {
    ManageContactsView& view = MakeLoaded();
    if (!ParseVCards("").opened) GTEST_SKIP() << kEbookContactsLibrary << " cannot be loaded";
    const std::string file = temp_ / "out.vcf";
    view.SetVCardPathSource([&](bool) { return file; });
    view.ShowPage(kContactsCardPage);
    const size_t cardRows = Names(kContactsCardPage).size();
    view.Command(kCmdContactExport);
    view.ShowPage(kContactsSimPage);
    view.Command(kCmdContactImport);  // the card's book into the SIM
    EXPECT_EQ(Names(kContactsSimPage).size(), 8 + cardRows);
    EXPECT_TRUE(boxes_.empty());

    // Neither a missing file nor an unwritable folder passes in silence; the SIM keeps its rows.
    const std::string missing = temp_ / "absent.vcf", unwritable = temp_ / "no/such/out.vcf";
    view.SetVCardPathSource([&](bool saving) { return saving ? unwritable : missing; });
    view.Command(kCmdContactImport);
    view.Command(kCmdContactExport);
    EXPECT_EQ(boxes_,
              (std::vector<std::u16string>{Utf8ToUtf16("Cannot read " + missing + "."),
                                           Utf8ToUtf16("Cannot write " + unwritable + ".")}));
    EXPECT_EQ(Names(kContactsSimPage).size(), 8 + cardRows);
}

TEST_F(ManageContactsViewTest, ScreenshotOfEachPageAndDialog) {
    std::ofstream(temp_ / "cards/a.vcf")
        << "BEGIN:VCARD\r\nVERSION:3.0\r\nFN:Greta Holm\r\nTEL;TYPE=CELL:+4670555\r\n"
           "TEL;TYPE=HOME:08555\r\nTEL;TYPE=WORK:08666\r\nEND:VCARD\r\n";
    ManageContactsView& view = Make();
    // Before the lists are read: the refusal of New.
    boxShot_ = "contacts-still-reading-box";
    view.ShowPage(kContactsSimPage);
    view.Command(kCmdContactNew);
    view.OnMessage(kMsgViewShown, 0, 0);
    ASSERT_TRUE(WaitUntil([&] { return view.LoadState().sim == 2; }));
    view.ShowPage(kContactsMobilePage);
    view.Command(kCmdContactRefresh);
    ASSERT_TRUE(
        WaitUntil([&] { return view.LoadState().outlook == 2 && !caches_.workers.Busy(); }));
    const char* names[kContactsPageCount] = {"contacts-sim", "contacts-card", "contacts-mobile",
                                             "contacts-home", "contacts-work"};
    for (int page = 0; page < kContactsPageCount; ++page) {
        view.ShowPage(page);
        QApplication::processEvents();
        EXPECT_GT(view.List(page)->topLevelItemCount(), 0);
        Shoot(&view, names[page]);
    }
    // Each dialog as the view opens it, filled in, then cancelled.
    auto shootDialog = [this](const char* name, const QString& newName, const QString& number) {
        answers_.push_back([=](ContactDialog& dialog) {
            if (!newName.isNull()) dialog.Name()->setText(newName);
            if (!number.isNull()) dialog.Number()->setText(number);
            Shoot(&dialog, name);
            return kIdCancel;
        });
    };
    view.ShowPage(kContactsSimPage);
    shootDialog("contacts-new-dialog", "Zed Test", "+4930123");
    view.Command(kCmdContactNew);
    ASSERT_NE(Select(kContactsSimPage, "Alice Smith"), nullptr);
    shootDialog("contacts-edit-dialog", {}, {});
    view.Command(kCmdContactEdit);
    PhonebookSaveGeometry(settings_, "me", 30, 8, 100);  // "Alice Smith" is cut to 8
    shootDialog("contacts-copy-dialog", {}, {});
    view.Command(kCmdContactCopyToCard);
    // A refusal of the dialog's check.
    boxShot_ = "contacts-check-box";
    Fill(QString(19, 'n'), "1");
    Fill(QString(19, 'n'), "1");
    view.Command(kCmdContactNew);
    EXPECT_TRUE(answers_.empty());
    ASSERT_EQ(boxes_.size(), 3u);  // the refusals: not read yet, then the name twice
}

}  // namespace
}  // namespace vqm
