// The Write SMS view and the contact picker in the program's main window on the offscreen
// platform, with the simulated card in-process on both its personalities: typing and the counter,
// the send on its worker with the box it ends with and the copies on the Sent page, the length
// question, the picker's OK and Cancel, and the hand-over from other views.
#include "messaging/write_sms_view.h"

#include <gtest/gtest.h>

#include <QAbstractButton>
#include <QApplication>
#include <QDialog>
#include <QKeyEvent>
#include <QLabel>
#include <QTreeWidget>
#include <chrono>
#include <cstring>
#include <filesystem>
#include <thread>

#include "cardsim/card_sim.h"
#include "contacts/contact_picker_view.h"
#include "link/link.h"
#include "messaging/sms_folder_view.h"
#include "shell/dialogs.h"
#include "shell/messages.h"
#include "shell/view_factories.h"
#include "support/settings_store.h"
#include "support/text.h"
#include "tests/common/sim_card_host.h"
#include "tests/common/temp_folder.h"

namespace vqm {
namespace {

using std::chrono::milliseconds;

class WriteSmsViewTest : public ::testing::TestWithParam<cardsim::Dialect> {
  protected:
    WriteSmsViewTest() {
        SetSettingString(settings_, u"InstallPath", Utf8ToUtf16(install_).c_str());
        std::filesystem::create_directories(install_);
        // On its very first run the Settings view gives the card the SIM-default centre, an
        // empty number, which leaves the simulated card nothing to send through: these tests
        // start as a dialer that has run before.
        const int32_t simDefault = 1;
        SetSettingInt(settings_, u"SettingsMessagesUseSIMDefault", &simDefault);
        dialogs_.SetResponder([this](const DialogRequest& request) {
            boxes_.push_back(Utf16ToUtf8(request.title + u": " + request.text));
            // The box the view shows, as a person would see it.
            if (request.box && !boxShot_.empty()) {
                SnapBox(request.box, boxShot_.c_str());
                boxShot_.clear();
            }
            return answer_;
        });
        caches_.pause = [](int) {};
    }
    ~WriteSmsViewTest() override {
        window_.reset();
        PortClose(link_);
    }
    void SetUp() override {
        cardsim::SimConfig config;
        config.baud = 0;
        config.stateFile = temp_ / "card.state";
        config.engine.dialect = GetParam();
        sim_ = std::make_unique<cardsim::CardSim>(config);
        ASSERT_TRUE(sim_->PowerUp());
        host_.device = sim_->DevicePath();
        context_.caches = &caches_;
        window_ = std::make_unique<MainWindow>(context_, DefaultViewFactories(), &host_);
        window_->StopWatchTimer();
        host_.messages = &window_->Messages();
        ASSERT_EQ(host_.OpenLink(), 1);
        window_->Watch().SetCardState(2);
        write_ = dynamic_cast<WriteSmsView*>(window_->ViewAt(kViewWriteSms));
        picker_ = dynamic_cast<ContactPickerView*>(window_->ViewAt(kViewContacts));
        folder_ = dynamic_cast<SmsFolderView*>(window_->ViewAt(kViewSmsFolder));
        ASSERT_NE(write_, nullptr);
        ASSERT_NE(picker_, nullptr);
        ASSERT_NE(folder_, nullptr);
        window_->Command(kCmdViewFirst + kViewWriteSms);
    }

    bool WaitFor(const std::function<bool()>& done, int limitMs = 10000) {
        const auto until = std::chrono::steady_clock::now() + milliseconds(limitMs);
        while (!done() && std::chrono::steady_clock::now() < until) {
            QApplication::processEvents(QEventLoop::AllEvents, 20);
            std::this_thread::sleep_for(milliseconds(2));
        }
        return done();
    }
    void Click(QWidget* view, int id) {
        auto* button = qobject_cast<QAbstractButton*>(FindControl(view, id));
        ASSERT_NE(button, nullptr) << id;
        button->click();
    }
    void Type(const std::u16string& text, QWidget* into = nullptr) {
        for (char16_t c : text) {
            QKeyEvent press(QEvent::KeyPress, 0, Qt::NoModifier, QString(QChar(c)));
            QApplication::sendEvent(into ? into : write_->TextEdit(), &press);
        }
    }
    std::string Counter() {
        auto* label = qobject_cast<QLabel*>(FindControl(write_, kWriteCounterId));
        return label ? label->text().toStdString() : "<none>";
    }
    // Sends what the fields hold and waits for the worker to report back.
    void SendAndWait() {
        Click(write_, kWriteSendId);
        ASSERT_TRUE(WaitFor([&] { return !write_->Sending(); }));
    }
    std::vector<SmsRecord> Local() {
        std::vector<SmsRecord> records;
        StoreReadAll(folder_->Store(), kFolderLocal, &records);
        return records;
    }
    int Rows(int page) { return folder_->List(page)->topLevelItemCount(); }
    void KnowContacts() {
        const std::pair<const char*, const char*> known[] = {{"Bob", "+447700900456"},
                                                             {"Alice", "+447700900123"}};
        FILE* file = std::fopen((install_ + "simphonebk1.db").c_str(), "wb");
        ASSERT_NE(file, nullptr);
        int index = 1;
        for (const auto& [name, number] : known) {
            PhonebookEntry entry{};
            entry.index = index++;
            entry.type = 145;
            std::snprintf(entry.number, sizeof entry.number, "%s", number);
            std::snprintf(entry.text, sizeof entry.text, "%s", name);
            entry.numberLength = static_cast<int32_t>(std::strlen(number));
            entry.textLength = static_cast<int32_t>(std::strlen(name));
            std::fwrite(&entry, sizeof entry, 1, file);
        }
        std::fclose(file);
    }
    // A picture of widget in the build's screenshot folder, taken on one personality only:
    // the two look the same.
    void Snap(QWidget* widget, const char* name) {
        if (GetParam() != cardsim::Dialect::Card) return;
        window_->show();
        QApplication::processEvents();
        Save(widget, name);
    }
    void SnapBox(QDialog* box, const char* name) {
        if (GetParam() != cardsim::Dialect::Card) return;
        box->show();  // a box sizes itself to its text when shown
        QApplication::processEvents();
        Save(box, name);
        box->hide();
    }
    static void Save(QWidget* widget, const char* name) {
        const std::string folder = VQM_SCREENSHOT_DIR;
        std::filesystem::create_directories(folder);
        EXPECT_TRUE(widget->grab().save(QString::fromStdString(folder + "/" + name + ".png")))
            << name;
    }

    const testing::TempFolder temp_;
    const std::string install_ = temp_ / "install/";
    SettingsStore settings_{temp_ / "settings.db"};
    Link link_{settings_, DriverRoots{temp_ / "run", temp_ / "tty"}};
    Dialogs dialogs_;
    ShellContext context_{settings_, link_, dialogs_, temp_ / "run"};
    PhonebookCaches caches_{settings_};
    testing::SimCardHost host_{link_};
    std::unique_ptr<cardsim::CardSim> sim_;
    std::unique_ptr<MainWindow> window_;
    WriteSmsView* write_ = nullptr;
    ContactPickerView* picker_ = nullptr;
    SmsFolderView* folder_ = nullptr;
    std::vector<std::string> boxes_;
    int answer_ = kIdOk;
    std::string boxShot_;  // the name of a picture to take of the next box
};

TEST_P(WriteSmsViewTest, CounterFollowsTypingAndTheLimitStopsOnlyKeys) {
    EXPECT_EQ(Counter(), "0/160");
    Snap(window_.get(), "write-empty");
    Type(std::u16string(160, u'a'));
    EXPECT_EQ(Counter(), "160/160");
    Type(u"b");  // the 161st key is refused
    EXPECT_EQ(write_->Text().size(), 160u);
    Click(write_, kWriteClearId);
    EXPECT_EQ(Counter(), "0/160");
    Type(u"Hello, see you at 8");
    Snap(window_.get(), "write-gsm");
    Click(write_, kWriteClearId);
    Type(Utf8ToUtf16("Καλημέρα!"));
    EXPECT_EQ(Counter(), "9/70");
    Snap(window_.get(), "write-ucs2");
    Type(std::u16string(70, u'x'));
    EXPECT_EQ(write_->Text().size(), 70u);
    // Text the program puts in stays whole, and the counter says how far over it is.
    write_->SetText(std::u16string(200, u'f'));
    EXPECT_EQ(Counter(), "200/160 (2 SMS)");
}

TEST_P(WriteSmsViewTest, SendReachesEachRecipientAndFilesTheCopiesOnTheSentPage) {
    write_->SetRecipients(u"12345; Bob<+44 7700 900456>");
    Type(u"Hello");
    Click(write_, kWriteSendId);
    EXPECT_TRUE(write_->Sending());  // on the worker: the window is back at once
    ASSERT_TRUE(WaitFor([&] { return !write_->Sending(); }));
    EXPECT_EQ(boxes_, std::vector<std::string>{"VQM Dialer: Message has been sent."});
    EXPECT_EQ(write_->Recipients(), u"12345;\nBob<+447700900456>;\n");  // the parsed form
    const std::vector<SmsRecord> local = Local();
    ASSERT_EQ(local.size(), 2u);
    EXPECT_STREQ(local[0].number, "12345");
    EXPECT_STREQ(local[1].number, "+447700900456");
    EXPECT_EQ(Rows(kPageSent), 2);
    EXPECT_EQ(folder_->CurrentPage(), kPageSent);

    // No recipients: nothing at all.
    boxes_.clear();
    write_->SetRecipients(u"");
    Click(write_, kWriteSendId);
    EXPECT_FALSE(write_->Sending());
    EXPECT_TRUE(boxes_.empty());
    EXPECT_EQ(Local().size(), 2u);
}

TEST_P(WriteSmsViewTest, TheLengthQuestionCutsOrKeeps) {
    write_->SetRecipients(u"12345");
    write_->SetText(std::u16string(161, u'z'));
    answer_ = kIdCancel;
    boxShot_ = "write-length-question";
    Click(write_, kWriteSendId);
    EXPECT_FALSE(write_->Sending());
    EXPECT_EQ(boxes_, std::vector<std::string>{"Error: Short message length exceeded, only first "
                                               "160 characters will be sent."});
    EXPECT_TRUE(Local().empty());
    answer_ = kIdOk;
    SendAndWait();
    const std::vector<SmsRecord> local = Local();
    ASSERT_EQ(local.size(), 1u);
    EXPECT_EQ(local[0].length, 160);
    EXPECT_EQ(write_->Text().size(), 161u);  // the field keeps what was typed
}

TEST_P(WriteSmsViewTest, PickerAddsTickedContactsAndKeepsWhatWasTyped) {
    KnowContacts();
    write_->SetRecipients(u"555");
    Type(u"typed");
    Click(write_, kWritePickerId);
    ASSERT_EQ(window_->Views().current, kViewContacts);
    ASSERT_TRUE(WaitFor([&] { return picker_->LoadState().loaded; }));
    QTreeWidget* sim = picker_->List(kPickerSimPage);
    ASSERT_EQ(sim->topLevelItemCount(), 2);
    EXPECT_EQ(sim->topLevelItem(0)->text(0), "Alice");  // sorted by name
    sim->topLevelItem(0)->setCheckState(0, Qt::Checked);
    sim->topLevelItem(1)->setCheckState(0, Qt::Checked);
    Snap(picker_, "picker");
    Click(picker_, kPickerOkId);
    EXPECT_EQ(window_->Views().current, kViewWriteSms);
    EXPECT_EQ(write_->Recipients(), u"555;\nAlice<+447700900123>;\nBob<+447700900456>;\n");
    EXPECT_EQ(write_->Text(), u"typed");

    // Back to the picker: the ticks are gone; Cancel and an empty OK add nothing.
    Click(write_, kWritePickerId);
    EXPECT_EQ(sim->topLevelItem(0)->checkState(0), Qt::Unchecked);
    picker_->TickAll(kPickerSimPage, true);
    Click(picker_, kPickerCancelId);
    EXPECT_EQ(window_->Views().current, kViewWriteSms);
    Click(write_, kWritePickerId);
    Click(picker_, kPickerOkId);
    EXPECT_EQ(write_->Recipients(), u"555;\nAlice<+447700900123>;\nBob<+447700900456>;\n");
    EXPECT_EQ(write_->Text(), u"typed");
}

TEST_P(WriteSmsViewTest, RequestsFromOtherViewsLandInTheFields) {
    window_->Command(kCmdViewFirst + kViewManageContacts);
    ASSERT_EQ(HandToWriteSms(context_, AddRecipientsRequest(u"Bob<+447700900456>;\r\n")), 1);
    EXPECT_EQ(window_->Views().current, kViewWriteSms);
    EXPECT_EQ(write_->Recipients(), u"Bob<+447700900456>;\n");
    Type(u"draft text");
    // Already in front: the request is taken at once.
    ASSERT_EQ(HandToWriteSms(context_, ForwardRequest(u"forwarded")), 1);
    EXPECT_EQ(write_->Recipients(), u"");
    EXPECT_EQ(write_->Text(), u"forwarded");
    EXPECT_EQ(Counter(), "9/160");

    // No window: nowhere to hand it.
    ShellContext bare{settings_, link_, dialogs_, temp_ / "run"};
    EXPECT_EQ(HandToWriteSms(bare, ReplyRequest(u"A<1>;\r\n")), 0);
}

// What a send reads of the recipients is all that can be typed; entries added from elsewhere
// beyond it stay, and Send then refuses, naming the entry the limit would cut, sending nothing.
TEST_P(WriteSmsViewTest, RecipientsBeyondWhatIsReadAreNeverCutShort) {
    QWidget* field = write_->RecipientsEdit();
    Type(std::u16string(250, u'1') + u";Bob<+447700900456>", field);
    EXPECT_EQ(write_->Recipients().size(), kRecipientsReadLimit);  // the rest was refused
    Click(write_, kWriteClearId);

    std::u16string many;  // 12 entries of 22 characters
    for (int i = 10; i < 22; ++i)
        many +=
            Utf8ToUtf16("Pal" + std::to_string(i) + "<+4477009000" + std::to_string(i) + ">;\r\n");
    write_->SetRecipients(many);
    Type(u"Hello");
    boxShot_ = "write-recipients-too-long";
    Click(write_, kWriteSendId);
    EXPECT_FALSE(write_->Sending());
    EXPECT_EQ(boxes_, std::vector<std::string>{Utf16ToUtf8(
                          u"Error: " + RecipientsTooLongText(u"Pal21<+447700900021>"))});
    EXPECT_TRUE(Local().empty());
    EXPECT_EQ(write_->Recipients().size(), many.size() - 12);  // left as it was, less the "\r"s

    // With room made, the first two go out.
    boxes_.clear();
    write_->SetRecipients(many.substr(0, 2 * 23));
    SendAndWait();
    EXPECT_EQ(boxes_, std::vector<std::string>{"VQM Dialer: Message has been sent."});
    ASSERT_EQ(Local().size(), 2u);
    EXPECT_STREQ(Local()[1].number, "+447700900011");
}

INSTANTIATE_TEST_SUITE_P(BothPersonalities, WriteSmsViewTest,
                         ::testing::Values(cardsim::Dialect::Card, cardsim::Dialect::Standard),
                         [](const auto& info) {
                             return info.param == cardsim::Dialect::Card ? "Card" : "Standard";
                         });

}  // namespace
}  // namespace vqm
