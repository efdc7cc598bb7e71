// The Call Forward, Call Barring and Security pages offscreen against the simulated card in
// both its personalities: what each control sends and shows, the password and code checks
// before anything reaches the card, the card's refusals with their reasons, a SIM blocked by
// wrong PINs, and a card pulled while a page waits for it. VQM_SCREENSHOTS=<folder> keeps a
// picture of every page and dialog.
#include <gtest/gtest.h>

#include <QApplication>
#include <QComboBox>
#include <QDialog>
#include <QLabel>
#include <QLineEdit>
#include <QPushButton>
#include <QRadioButton>
#include <QTabBar>
#include <chrono>
#include <deque>
#include <filesystem>
#include <fstream>
#include <functional>
#include <memory>
#include <sstream>
#include <string>
#include <thread>
#include <vector>

#include "cardsim/card_sim.h"
#include "link/link.h"
#include "settings/barring_page.h"
#include "settings/forward_page.h"
#include "settings/forwarding_at.h"
#include "settings/security_at.h"
#include "settings/security_page.h"
#include "shell/dialogs.h"
#include "shell/messages.h"
#include "support/settings_store.h"
#include "tests/common/link_waits.h"
#include "tests/common/temp_folder.h"

namespace vqm {
namespace {

namespace fs = std::filesystem;
using cardsim::Dialect;
using Clock = std::chrono::steady_clock;
using testing::TempFolder;

constexpr int kIdOk = 1, kIdCancel = 2;
constexpr char16_t kActivationError[] = u"Activation Error!\nPlease check your password.";

struct Box {
    std::u16string text;
    unsigned style;
};

class ServicesPagesTest : public ::testing::TestWithParam<Dialect> {
  protected:
    ServicesPagesTest() {
        cardsim::SimConfig config;
        config.baud = 0;
        config.runtimeDir = temp_ / "sim";
        config.stateFile = temp_ / "card.state";
        config.engine.dialect = GetParam();
        sim_ = std::make_unique<cardsim::CardSim>(config);
        EXPECT_TRUE(sim_->PowerUp());
        testing::ShortenLinkWaits(link_);
        EXPECT_EQ(PortOpenDevice(link_, sim_->DevicePath().c_str()), 1);
        dialogs_.SetResponder([this](const DialogRequest& request) {
            if (!request.isDialog) {
                boxes_.push_back({request.text, request.style});
                return kIdOk;
            }
            Shoot(request.dialog, request.text);
            if (answers_.empty()) return kIdCancel;
            auto answer = std::move(answers_.front());
            answers_.pop_front();
            return answer(request.dialog);
        });
        host_.resize(240, 268);
    }
    ~ServicesPagesTest() override {
        page_.reset();
        PortClose(link_);
    }

    template <class Page>
    Page* Make() {
        auto* page = new Page(&host_, context_);
        page_.reset(page);
        page->show();
        return page;
    }
    // The next dialog's answer: fill it in, then press a button.
    void Answer(std::function<int(QDialog*)> answer) { answers_.push_back(std::move(answer)); }
    void AnswerCode(int fieldId, const QString& code) {
        Answer([fieldId, code](QDialog* dialog) {
            qobject_cast<QLineEdit*>(FindControl(dialog, fieldId))->setText(code);
            return kIdOk;
        });
    }
    void Click(QWidget* root, int id) {
        auto* button = qobject_cast<QPushButton*>(FindControl(root, id));
        ASSERT_NE(button, nullptr) << id;
        button->click();
    }
    // Delivers the page's results until none is outstanding.
    void Settle(const CardJobs& jobs) {
        const auto deadline = Clock::now() + std::chrono::seconds(10);
        while (jobs.Pending() > 0 && Clock::now() < deadline)
            QApplication::processEvents(QEventLoop::AllEvents, 20);
        ASSERT_EQ(jobs.Pending(), 0) << "the card's answers did not come";
        EXPECT_EQ(QApplication::overrideCursor(), nullptr) << "the wait cursor stayed";
    }
    std::vector<std::u16string> TakeBoxes() {
        std::vector<std::u16string> texts;
        for (const Box& box : boxes_)
            texts.push_back(box.text);
        boxes_.clear();
        return texts;
    }
    // The card's kept state, once a line starting with prefix is (or is not) in it: the card
    // writes it right after the change that the page's answer reported.
    bool StateHas(const std::string& line, bool wanted = true) {
        const auto deadline = Clock::now() + std::chrono::seconds(3);
        do {
            std::ifstream file(temp_ / "card.state");
            std::stringstream text;
            text << file.rdbuf();
            if ((("\n" + text.str()).find("\n" + line) != std::string::npos) == wanted) return true;
            std::this_thread::yield();
        } while (Clock::now() < deadline);
        return false;
    }
    void Shoot(QWidget* widget, const std::u16string& name) {
        const QString folder = qEnvironmentVariable("VQM_SCREENSHOTS");
        if (folder.isEmpty() || GetParam() != Dialect::Card) return;
        fs::create_directories(folder.toStdString());
        if (qobject_cast<QDialog*>(widget)) widget->adjustSize();  // pages keep their place
        widget->grab().save(folder + "/" + QString::fromStdU16String(name) + ".png");
    }

    TempFolder temp_;
    SettingsStore settings_{temp_ / "settings.db"};
    std::unique_ptr<cardsim::CardSim> sim_;
    Link link_{settings_, DriverRoots{temp_ / "run", temp_ / "tty"}};
    Dialogs dialogs_;
    ShellContext context_{settings_, link_, dialogs_, temp_ / "run"};
    QWidget host_;
    std::unique_ptr<View> page_;
    std::deque<std::function<int(QDialog*)>> answers_;
    std::vector<Box> boxes_;
};

// ---- Call Forward ----

TEST_P(ServicesPagesTest, ForwardRequestShowsEachReasonAndGreysTheConditionalRows) {
    struct Case {
        const char* network;  // the forwards the network holds
        int index;            // sub-page
        std::vector<std::u16string> rows;
        bool conditionalEnabled;
    };
    const Case cases[] = {
        {"forward 0 1 on +441234567890",
         0,
         {u"+441234567890", u"NOT ACTIVE", u"NOT ACTIVE", u"NOT ACTIVE"},
         false},
        {"forward 0 1 on +441234567890",
         1,
         {u"NOT ACTIVE", u"NOT ACTIVE", u"NOT ACTIVE", u"NOT ACTIVE"},
         true},
        {"forward 1 2 on 0123", 1, {u"NOT ACTIVE", u"0123", u"NOT ACTIVE", u"NOT ACTIVE"}, true},
        // One forward for all three classes shows on each sub-page.
        {"forward 3 7 on 0999", 2, {u"NOT ACTIVE", u"NOT ACTIVE", u"NOT ACTIVE", u"0999"}, true},
        {"forward 3 7 on 0999", 0, {u"NOT ACTIVE", u"NOT ACTIVE", u"NOT ACTIVE", u"0999"}, true},
    };
    auto* page = Make<ForwardPage>();
    for (const Case& c : cases) {
        ASSERT_EQ(sim_->Control("forward 0 7 off"), "OK");
        ASSERT_EQ(sim_->Control("forward 1 7 off"), "OK");
        ASSERT_EQ(sim_->Control("forward 3 7 off"), "OK");
        ASSERT_EQ(sim_->Control(c.network), "OK");
        // A greyed row from the case before must not survive a Request that finds none.
        page->State(c.index, 1)->setEnabled(!c.conditionalEnabled);
        Click(page->SubPage(c.index), kForwardRequestId);
        EXPECT_NE(QApplication::overrideCursor(), nullptr) << "no wait cursor while asking";
        Settle(page->Jobs());
        for (int reason = 0; reason < 4; ++reason) {
            EXPECT_EQ(page->State(c.index, reason)->text().toStdU16String(), c.rows[reason])
                << c.network << " page " << c.index << " row " << reason;
            if (reason > 0) {
                EXPECT_EQ(page->State(c.index, reason)->isEnabled(), c.conditionalEnabled);
                EXPECT_EQ(page->RowButton(c.index, reason)->isEnabled(), c.conditionalEnabled);
            }
        }
    }
    Shoot(page, u"forward_page");
    EXPECT_TRUE(boxes_.empty());
}

TEST_P(ServicesPagesTest, ForwardDialogSendsTheChoiceAndTheRowFollows) {
    enum Choice { Activate, Deactivate, Neither, Cancel };
    struct Case {
        int reason;
        Choice choice;
        const char16_t* number;
        int timeIndex;                  // -1 leaves "20"
        const char* state;              // the card's kept forward afterwards ("" none), or gone
        const char16_t* row;            // the row's text afterwards
        bool stored;                    // the number is kept as the last one used
        const char16_t* box = nullptr;  // refused before the card, with this box
    };
    const std::u16string ask = u"Please enter the number to forward the calls to.";
    const std::u16string unknown = u"\"Unknown\" is not a phone number.\n" + ask;
    const std::u16string letters = u"\"12ab\" is not a phone number.\n" + ask;
    const Case cases[] = {
        // "Activate To:" offers "Unknown" while no number was used there: not sent.
        {1, Activate, nullptr, -1, "!net-forward 1 1", u"Unknown", false, unknown.c_str()},
        {1, Activate, u"+441234567890", 2, "net-forward 1 1 +441234567890 145 20 1",
         u"+441234567890", true},
        {2, Activate, u"0123", 0, "net-forward 2 1 0123 129 10 1", u"0123", true},
        {2, Activate, u"0124", -1, "net-forward 2 1 0124 129 20 1", u"0124", true},
        {2, Activate, u"0125", 2, "net-forward 2 1 0125 129 30 1", u"0125", true},
        {0, Activate, u"0777", 0, "net-forward 0 1 0777 129 20 1", u"0777", true},
        {3, Activate, u"0999", 2, "net-forward 3 1 0999 129 20 1", u"0999", true},
        // Deactivating does not look at the edit.
        {3, Deactivate, u"Unknown", -1, "!net-forward 3 1", u"NOT ACTIVE", false},
        // Not a phone number: refused with a box before the card, the row keeps its text.
        {1, Activate, u"12ab", -1, "net-forward 1 1 +441234567890", u"+441234567890", false,
         letters.c_str()},
        {1, Activate, u"", -1, "net-forward 1 1 +441234567890", u"+441234567890", false,
         ask.c_str()},
        {1, Activate, u"   ", -1, "net-forward 1 1 +441234567890", u"+441234567890", false,
         ask.c_str()},
        // A phone number the network cannot dial (the blank): refused by the card, silently,
        // and the row keeps its text.
        {1, Activate, u"0123 456", -1, "net-forward 1 1 +441234567890", u"+441234567890", false},
        {1, Neither, nullptr, -1, "net-forward 1 1 +441234567890", u"+441234567890", false},
        {1, Cancel, u"0555", -1, "net-forward 1 1 +441234567890", u"+441234567890", false},
    };
    auto* page = Make<ForwardPage>();
    for (const Case& c : cases) {
        const std::u16string before = page->State(0, c.reason)->text().toStdU16String();
        char16_t stored[40] = u"";
        const std::u16string name = u"CallForward1" + std::u16string(1, u'0' + c.reason);
        GetSettingString(settings_, name.c_str(), stored, 40);
        const std::u16string storedBefore = stored;
        Answer([&](QDialog* dialog) {
            auto* edit = qobject_cast<QLineEdit*>(FindControl(dialog, kForwardNumberEditId));
            auto* time = qobject_cast<QComboBox*>(FindControl(dialog, kForwardTimeListId));
            // Opening: the row's text, "20" chosen, the list greyed until "Activate To:".
            EXPECT_EQ(edit->text().toStdU16String(), before);
            EXPECT_EQ(time->currentText(), "20");
            EXPECT_FALSE(time->isEnabled());
            if (c.choice == Activate) {
                qobject_cast<QRadioButton*>(FindControl(dialog, kForwardActivateRadioId))->click();
                EXPECT_EQ(edit->text().toStdU16String(),
                          storedBefore.empty() ? u"Unknown" : storedBefore);
                EXPECT_EQ(time->isEnabled(), c.reason == kForwardNoReply);
            }
            if (c.choice == Deactivate)
                qobject_cast<QRadioButton*>(FindControl(dialog, kForwardDeactivateRadioId))
                    ->click();
            if (c.number) edit->setText(QString::fromStdU16String(c.number));
            if (c.timeIndex >= 0) time->setCurrentIndex(c.timeIndex);
            return c.choice == Cancel ? kIdCancel : kIdOk;
        });
        Click(page->SubPage(0), kForwardButtonFirstId + c.reason);
        if (c.box) {
            EXPECT_EQ(page->Jobs().Pending(), 0) << "sent to the card";
        }
        Settle(page->Jobs());
        EXPECT_EQ(TakeBoxes(),
                  c.box ? std::vector<std::u16string>{c.box} : std::vector<std::u16string>{})
            << c.state;
        const bool gone = c.state[0] == '!';
        EXPECT_TRUE(StateHas(gone ? c.state + 1 : c.state, !gone)) << c.state;
        EXPECT_EQ(page->State(0, c.reason)->text().toStdU16String(), c.row) << c.state;
        stored[0] = 0;
        GetSettingString(settings_, name.c_str(), stored, 40);
        EXPECT_EQ(std::u16string(stored), c.stored ? std::u16string(c.number) : storedBefore);
    }
    EXPECT_TRUE(answers_.empty());
}

// A person's "Send Request" with something that is not a phone number shows why and leaves the
// dialog open with the text, to be corrected; a phone number, or "Deactivate", closes it.
TEST_P(ServicesPagesTest, ForwardDialogStaysOpenUntilItHoldsAPhoneNumber) {
    const std::u16string ask = u"Please enter the number to forward the calls to.";
    ForwardDialog dialog(&host_, context_, 1, kForwardBusy, "NOT ACTIVE");
    QPushButton* send = nullptr;
    for (QPushButton* button : dialog.findChildren<QPushButton*>())
        if (button->text() == "Send Request") send = button;
    ASSERT_NE(send, nullptr);
    const struct {
        bool activate;
        const char16_t* number;  // nullptr keeps what the radio put there
        std::vector<std::u16string> boxes;
        bool closes;
    } steps[] = {
        {true, nullptr, {u"\"Unknown\" is not a phone number.\n" + ask}, false},
        {true, u"", {ask}, false},
        {true, u"Ann", {u"\"Ann\" is not a phone number.\n" + ask}, false},
        {true,
         u"123456789012345678901",
         {u"\"123456789012345678901\" is not a phone number.\n" + ask},
         false},
        {true, u"+44 (20) 1234 5678", {}, true},
        {false, u"Unknown", {}, true},
    };
    int n = 0;
    for (const auto& step : steps) {
        SCOPED_TRACE(n++);
        dialog.setResult(0);
        dialog.show();
        qobject_cast<QRadioButton*>(FindControl(&dialog, step.activate ? kForwardActivateRadioId
                                                                       : kForwardDeactivateRadioId))
            ->click();
        if (step.number) dialog.Number()->setText(QString::fromStdU16String(step.number));
        send->click();
        EXPECT_EQ(TakeBoxes(), step.boxes);
        EXPECT_EQ(dialog.isVisible(), !step.closes);
        EXPECT_EQ(dialog.result(), step.closes ? 1 : 0);
        if (!step.closes && step.number) {
            EXPECT_EQ(dialog.Number()->text().toStdU16String(), step.number);
        }
    }
}

// The time list counts only for "Unanswered:"; every other reason sends 20 seconds.
TEST_P(ServicesPagesTest, ForwardDialogTimeIsTheListsOnlyForNoReply) {
    for (int reason = 0; reason < 4; ++reason)
        for (int index = 0; index < 3; ++index) {
            ForwardDialog dialog(&host_, context_, 1, reason, "Unknown");
            dialog.Activate()->click();
            dialog.TimeList()->setCurrentIndex(index);
            EXPECT_EQ(dialog.Seconds(), reason == kForwardNoReply ? (index + 1) * 10 : 20)
                << reason << " " << index;
            if (reason == kForwardNoReply && index == 1) Shoot(&dialog, u"forward_dialog");
        }
}

TEST_P(ServicesPagesTest, DeactivationsMarkTheRowsEvenWhenTheCardFails) {
    auto* page = Make<ForwardPage>();
    ASSERT_EQ(sim_->Control("forward 0 7 on 0777"), "OK");
    ASSERT_EQ(sim_->Control("forward 2 2 on 0888"), "OK");
    for (int index = 0; index < 3; ++index) {
        Click(page->SubPage(index), kForwardRequestId);
        Settle(page->Jobs());
        EXPECT_FALSE(page->State(index, 2)->isEnabled());
    }
    // One class: every row of it is off and usable again; the others keep theirs.
    Click(page->SubPage(1), kForwardDeactivateClassId);
    Settle(page->Jobs());
    for (int reason = 0; reason < 4; ++reason) {
        EXPECT_EQ(page->State(1, reason)->text(), "NOT ACTIVE");
        EXPECT_TRUE(page->State(1, reason)->isEnabled());
    }
    EXPECT_EQ(page->State(0, 0)->text(), "0777");
    EXPECT_TRUE(StateHas("net-forward 2 2 0888 129 20 0"));

    // All classes, with the card gone before it could answer: marked off all the same.
    sim_->Control("pull");
    Click(page, kForwardDeactivateAllId);
    Settle(page->Jobs());
    for (int index = 0; index < 3; ++index) {
        EXPECT_EQ(page->State(index, 0)->text(), "NOT ACTIVE") << index;
        EXPECT_TRUE(page->State(index, 2)->isEnabled()) << index;
    }
    // A failed query is "Unknown", and the rows stay as they were.
    Click(page->SubPage(2), kForwardRequestId);
    Settle(page->Jobs());
    EXPECT_EQ(page->State(2, 0)->text(), "Unknown");
    EXPECT_TRUE(page->State(2, 1)->isEnabled());
    EXPECT_TRUE(boxes_.empty());
}

// ---- Call Barring ----

TEST_P(ServicesPagesTest, BarringAsksThePasswordAndShowsEachFacility) {
    struct Case {
        int index;
        int button;
        const char* password;
        std::vector<std::u16string> boxes;
        const char* barred;  // the card's kept barring afterwards
    };
    const std::u16string length = u"Password must be 4 digits long!";
    const std::u16string digits = u"A code may hold digits only (0 to 9).";
    const Case cases[] = {
        {0, kBarInternationalId, "0000", {}, "net-barring OI 1"},
        {1, kBarRoamingId, "0000", {}, "net-barring IR 2"},
        {2,
         kBarAllOutgoingId,
         "1111",
         {std::u16string(kActivationError) + u"\nincorrect password"},
         "net-barring AO 0"},
        // Never sent: the card's state would change or refuse, and no exchange starts.
        {0, kBarAllIncomingId, "000", {length}, "net-barring AI 0"},
        {0, kBarAllIncomingId, "00000", {length}, "net-barring AI 0"},
        {0,
         kBarAllIncomingId,
         "0000000000000000000000000000000000000000",
         {length},
         "net-barring AI 0"},
        {0, kBarAllIncomingId, "00a0", {digits}, "net-barring AI 0"},
        {0, kBarAllIncomingId, "0 00", {digits}, "net-barring AI 0"},
        {0, kBarAllIncomingId, "0\"00", {digits}, "net-barring AI 0"},
        {0, kLiftOutgoingId, "12", {length}, "net-barring OI 1"},
        {0,
         kLiftOutgoingId,
         "1111",
         {u"Cannot disable voice outgoing barring.\nincorrect password"},
         "net-barring OI 1"},
        {1,
         kLiftIncomingId,
         "1111",
         {u"Cannot disable data incoming barring.\nincorrect password"},
         "net-barring IR 2"},
        {2,
         kLiftClassId,
         "1111",
         {u"Cannot disable all fax barring.\nincorrect password"},
         "net-barring OI 1"},
        {0, kLiftOutgoingId, "0000", {}, "net-barring OI 0"},
    };
    auto* page = Make<BarringPage>();
    for (const Case& c : cases) {
        AnswerCode(kPasswordEditId, c.password);
        Click(page->SubPage(c.index), c.button);
        const bool sent = c.boxes.empty() || c.boxes[0].find(u"\n") != std::u16string::npos;
        EXPECT_EQ(page->Jobs().Pending() > 0, sent) << c.password;
        Settle(page->Jobs());
        EXPECT_EQ(TakeBoxes(), c.boxes) << c.password;
        EXPECT_TRUE(StateHas(c.barred)) << c.barred;
    }
    // Lifting failures carry the stop icon.
    AnswerCode(kPasswordEditId, "9999");
    Click(page->SubPage(0), kLiftClassId);
    Settle(page->Jobs());
    ASSERT_EQ(boxes_.size(), 1u);
    EXPECT_EQ(boxes_[0].style & 0xF0, 0x10u);
    boxes_.clear();
    Shoot(page, u"barring_page");
}

TEST_P(ServicesPagesTest, BarringRequestMarksAndDisableAll) {
    auto* page = Make<BarringPage>();
    // Request: a mark per facility, and a barring for all classes marks every sub-page.
    ASSERT_EQ(sim_->Control("barring IR 2 on"), "OK");
    ASSERT_EQ(sim_->Control("barring AI 7 on"), "OK");
    ASSERT_EQ(sim_->Control("barring OX 2 on"), "OK");
    for (int index = 0; index < 3; ++index) {
        Click(page->SubPage(index), kBarringRequestId);
        Settle(page->Jobs());
        EXPECT_EQ(page->Mark(index, kBarAllIncomingId)->text(), QString::fromUtf8("\u2713"));
        EXPECT_EQ(page->Mark(index, kBarExceptHomeId)->text().isEmpty(), index != 1);
        EXPECT_EQ(page->Mark(index, kBarRoamingId)->text().isEmpty(), index != 1);
        EXPECT_TRUE(page->Mark(index, kBarAllOutgoingId)->text().isEmpty());
    }
    Shoot(page, u"barring_page_marks");
    PasswordDialog dialog(&host_);
    Shoot(&dialog, u"password_dialog");

    // Disable All Call Barrings: a wrong password is told, the right one clears every mark.
    AnswerCode(kPasswordEditId, "1234");
    Click(page, kLiftAllBarringsId);
    Settle(page->Jobs());
    EXPECT_EQ(TakeBoxes(),
              std::vector<std::u16string>{u"Cannot disable all barring.\nincorrect password"});
    AnswerCode(kPasswordEditId, "0000");
    Click(page, kLiftAllBarringsId);
    Settle(page->Jobs());
    EXPECT_TRUE(boxes_.empty());
    EXPECT_TRUE(StateHas("net-barring AI 0"));
    for (int index = 0; index < 3; ++index)
        EXPECT_TRUE(page->Mark(index, kBarAllIncomingId)->text().isEmpty());

    // A card that cannot answer leaves every mark unknown.
    sim_->Control("pull");
    Click(page->SubPage(0), kBarringRequestId);
    Settle(page->Jobs());
    EXPECT_EQ(page->Mark(0, kBarInternationalId)->text(), "?");
}

// ---- Security ----

TEST_P(ServicesPagesTest, ChangeAccessCodeChecksInOrderBeforeTheCard) {
    struct Case {
        int which;
        const char* oldCode;
        const char* newCode;
        const char* confirm;
        const char16_t* box;  // nullptr: changed
        bool sent;            // an exchange with the card was started
    };
    const char16_t* pinRule = u"Password length must between 1 and 8!";
    const char16_t* digits = u"A code may hold digits only (0 to 9).";
    const Case cases[] = {
        // A mismatch is told before any other rule.
        {0, "", "123456789", "12345678", u"New code does not match.", false},
        {3, "0000", "12345", "1234", u"New code does not match.", false},
        {0, "1234", "123456789", "123456789", pinRule, false},
        {0, "1234", "", "", pinRule, false},
        {1, "5678", "1234567890123456789012345678901234567890",
         "1234567890123456789012345678901234567890", pinRule, false},
        {0, "1234", "12ab", "12ab", digits, false},
        {0, "1234", "12 4", "12 4", digits, false},
        {0, "12\"4", "4321", "4321", digits, false},
        {2, "12345", "1234", "1234", u"Password must be 5 digits long!", false},
        {3, "0000", "12345", "12345", u"Password must be 4 digits long!", false},
        // The PIN request is off on the demo SIM.
        {0, "1234", "4321", "4321",
         u"You must set the PIN code request to on before changing the PIN code!", true},
        {1, "5678", "8765", "8765", nullptr, true},
        {1, "0000", "5678", "5678",
         u"Cannot change code! Please check your old code.\nincorrect password", true},
        {3, "0000", "2468", "2468", nullptr, true},
        {2, "12345", "54321", "54321", nullptr, true},
    };
    auto* page = Make<SecurityPage>();
    for (const Case& c : cases) {
        Answer([&](QDialog* dialog) {
            qobject_cast<QComboBox*>(FindControl(dialog, kChangeListId))->setCurrentIndex(c.which);
            qobject_cast<QLineEdit*>(FindControl(dialog, kOldCodeEditId))->setText(c.oldCode);
            qobject_cast<QLineEdit*>(FindControl(dialog, kNewCodeEditId))->setText(c.newCode);
            qobject_cast<QLineEdit*>(FindControl(dialog, kConfirmCodeEditId))->setText(c.confirm);
            return kIdOk;
        });
        Click(page, kChangeCodeId);
        EXPECT_EQ(page->Jobs().Pending() > 0, c.sent) << c.newCode;
        Settle(page->Jobs());
        EXPECT_EQ(TakeBoxes(),
                  c.box ? std::vector<std::u16string>{c.box} : std::vector<std::u16string>{})
            << c.which << " " << c.newCode;
    }
    EXPECT_TRUE(StateHas("net-password P2 8765"));
    EXPECT_TRUE(StateHas("net-password AB 2468"));
    EXPECT_TRUE(StateHas("net-password PS 54321"));

    // PIN2 with its lock off is refused before any code goes, with its own words.
    ASSERT_EQ(SetLock(link_, 1, 0, u"8765"), 0);
    Answer([](QDialog* dialog) {
        qobject_cast<QComboBox*>(FindControl(dialog, kChangeListId))->setCurrentIndex(1);
        for (int id : {kOldCodeEditId, kNewCodeEditId, kConfirmCodeEditId})
            qobject_cast<QLineEdit*>(FindControl(dialog, id))->setText("8765");
        return kIdOk;
    });
    Click(page, kChangeCodeId);
    Settle(page->Jobs());
    EXPECT_EQ(TakeBoxes(),
              std::vector<std::u16string>{
                  u"You must set the PIN code request to on before changing the PIN2 code!"});
    ChangeCodeDialog dialog(&host_);
    Shoot(&dialog, u"change_code_dialog");
}

// Switch the PIN request on and change the PIN; three wrong PINs then block the SIM, and the
// page says so wherever it asks the card.
TEST_P(ServicesPagesTest, PinRequestLockStatusAndABlockedSim) {
    auto* page = Make<SecurityPage>();
    struct Step {
        int button;
        int field;
        const char* code;
        std::vector<std::u16string> boxes;
        int pinOn, lockOn;  // which of the pairs' buttons are checked afterwards (-1 neither)
    };
    const std::u16string pinFail = u"Cannot change PIN Lock status!";
    const std::u16string lockFail = u"Cannot change Phone Lock status!";
    const Step steps[] = {
        {kRequestStatusId, 0, nullptr, {}, 0, 0},
        {kPinRequestOnId,
         kSingleCodeEditId,
         "123456789",
         {u"Password length must between 1 and 8!"},
         0,
         0},
        {kPinRequestOnId, kSingleCodeEditId, "1234", {}, 1, 0},
        {kPhoneLockOnId, kSingleCodeEditId, "1234", {u"Password must be 5 digits long!"}, 1, 0},
        {kPhoneLockOnId,
         kSingleCodeEditId,
         "12a45",
         {u"A code may hold digits only (0 to 9)."},
         1,
         0},
        {kPhoneLockOnId, kSingleCodeEditId, "11111", {lockFail + u"\nincorrect password"}, 1, 0},
        {kPhoneLockOnId, kSingleCodeEditId, "12345", {}, 1, 1},
        {kPinRequestOffId, kSingleCodeEditId, "0000", {pinFail + u"\nincorrect password"}, 1, 1},
        {kPinRequestOffId, kSingleCodeEditId, "0000", {pinFail + u"\nincorrect password"}, 1, 1},
        {kPinRequestOffId, kSingleCodeEditId, "0000", {pinFail + u"\nSIM PUK required"}, 1, 1},
        {kPinRequestOffId, kSingleCodeEditId, "1234", {pinFail + u"\nSIM PUK required"}, 1, 1},
        {kRequestStatusId, 0, nullptr, {u"Request error\nSIM PUK required"}, -1, 1},
    };
    for (const Step& step : steps) {
        if (step.code) AnswerCode(step.field, step.code);
        Click(page, step.button);
        Settle(page->Jobs());
        EXPECT_EQ(TakeBoxes(), step.boxes) << step.button << " " << (step.code ? step.code : "");
        EXPECT_EQ(page->Button(kPinRequestOnId)->isChecked(), step.pinOn == 1) << step.button;
        EXPECT_EQ(page->Button(kPinRequestOffId)->isChecked(), step.pinOn == 0) << step.button;
        EXPECT_EQ(page->Button(kPhoneLockOnId)->isChecked(), step.lockOn == 1) << step.button;
        EXPECT_EQ(page->Button(kPhoneLockOffId)->isChecked(), step.lockOn == 0) << step.button;
    }
    // Changing the PIN of a blocked SIM is told as a failed query.
    Answer([](QDialog* dialog) {
        for (int id : {kOldCodeEditId, kNewCodeEditId, kConfirmCodeEditId})
            qobject_cast<QLineEdit*>(FindControl(dialog, id))->setText("1234");
        return kIdOk;
    });
    Click(page, kChangeCodeId);
    Settle(page->Jobs());
    EXPECT_EQ(TakeBoxes(), std::vector<std::u16string>{u"Request error\nSIM PUK required"});
    Shoot(page, u"security_page");

    // Reset by the network side: the PIN works again and can be changed.
    ASSERT_EQ(sim_->Control("sim-reset"), "OK");
    Answer([](QDialog* dialog) {
        qobject_cast<QLineEdit*>(FindControl(dialog, kOldCodeEditId))->setText("1234");
        for (int id : {kNewCodeEditId, kConfirmCodeEditId})
            qobject_cast<QLineEdit*>(FindControl(dialog, id))->setText("24680");
        return kIdOk;
    });
    Click(page, kChangeCodeId);
    Settle(page->Jobs());
    EXPECT_TRUE(boxes_.empty());
    EXPECT_TRUE(StateHas("net-password SC 24680"));
    CodeDialog pin(&host_, "PIN_CODE_REQUEST_DIALOG", "PIN Code Request", "PIN Code:");
    Shoot(&pin, u"pin_dialog");
}

// A card pulled while the page waits for it: the answer is a failure, told as one, and the
// wait cursor goes.
TEST_P(ServicesPagesTest, PulledCardWhileWaiting) {
    auto* page = Make<SecurityPage>();
    ASSERT_EQ(sim_->Control("silent on"), "OK");
    AnswerCode(kSingleCodeEditId, "1234");
    Click(page, kPinRequestOnId);
    EXPECT_NE(QApplication::overrideCursor(), nullptr);
    // The card watch closes the link when the card goes.
    std::thread watch([this] {
        sim_->Control("pull");
        PortClose(link_);
    });
    Settle(page->Jobs());
    watch.join();
    EXPECT_EQ(TakeBoxes(), std::vector<std::u16string>{u"Cannot change PIN Lock status!"});
    // Both states unknown now: told once, and neither button of either pair is pressed.
    Click(page, kRequestStatusId);
    Settle(page->Jobs());
    EXPECT_EQ(TakeBoxes(), std::vector<std::u16string>{u"Request error"});
    for (int id : {kPhoneLockOnId, kPhoneLockOffId, kPinRequestOnId, kPinRequestOffId})
        EXPECT_FALSE(page->Button(id)->isChecked()) << id;
}

INSTANTIATE_TEST_SUITE_P(BothPersonalities, ServicesPagesTest,
                         ::testing::Values(Dialect::Card, Dialect::Standard), [](const auto& info) {
                             return info.param == Dialect::Card ? "Card" : "Standard";
                         });

}  // namespace
}  // namespace vqm
