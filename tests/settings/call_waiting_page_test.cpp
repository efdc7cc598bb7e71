// Call waiting in the window, on the offscreen platform: the Settings view's Call Waiting page
// pressed button by button against the simulated card in-process, in both dialects, and a second
// caller ringing during a call on the DialPad beside it.
#include "settings/call_waiting_page.h"

#include <gtest/gtest.h>

#include <QAbstractButton>
#include <QApplication>
#include <QLabel>
#include <QLineEdit>
#include <QTabBar>
#include <chrono>
#include <cstdlib>
#include <filesystem>
#include <thread>

#include "calls/dial_pad_view.h"
#include "cardsim/card_sim.h"
#include "link/link.h"
#include "settings/settings_view.h"
#include "shell/dialogs.h"
#include "shell/messages.h"
#include "support/settings_store.h"
#include "support/text.h"
#include "tests/common/sim_card_host.h"
#include "tests/common/temp_folder.h"
#include "tests/common/wait.h"

namespace vqm {
namespace {

using std::chrono::milliseconds;
using testing::SimCardHost;

class CallWaitingWindowTest : public ::testing::TestWithParam<cardsim::Dialect> {
  protected:
    CallWaitingWindowTest() {
        SetSettingString(settings_, u"InstallPath", Utf8ToUtf16(temp_ / "install/").c_str());
        dialogs_.SetResponder([this](const DialogRequest& request) {
            boxes_.push_back(request.text);
            return kIdOk;
        });
        cardsim::SimConfig config;
        config.baud = 0;
        config.engine.dialect = GetParam();
        config.engine.dialDelayMs = 100;
        config.engine.ringTimeoutMs = 600000;
        config.stateFile = temp_ / "card.state";
        sim_ = std::make_unique<cardsim::CardSim>(config);
        EXPECT_TRUE(sim_->PowerUp());
        host_.device = sim_->DevicePath();

        std::array<ViewFactory, kViewCount> factories;
        for (int i = 0; i < kViewCount; ++i)
            factories[i] = [](QWidget* parent, ShellContext&) { return new View(parent); };
        factories[kViewDialPad] = [](QWidget* parent, ShellContext& context) -> View* {
            return new DialPadView(parent, context);
        };
        factories[kViewSettings] = [](QWidget* parent, ShellContext& context) -> View* {
            return new SettingsView(parent, context);
        };
        window_ = std::make_unique<MainWindow>(context_, factories, &host_);
        window_->StopWatchTimer();
        host_.messages = &window_->Messages();
        pad_ = dynamic_cast<DialPadView*>(window_->ViewAt(kViewDialPad));
        auto* settingsView = dynamic_cast<SettingsView*>(window_->ViewAt(kViewSettings));
        page_ = settingsView
                    ? dynamic_cast<CallWaitingPage*>(settingsView->Page(kSettingsCallWaiting))
                    : nullptr;
        EXPECT_EQ(host_.OpenLink(), 1);
        window_->Watch().SetCardState(2);
        // The DialPad asks the card to present waiting callers as it connects; the page's
        // requests come after.
        EXPECT_TRUE(WaitFor([&] { return sim_->Control("call-waiting") == "OK off last=+CCWA=1"; }))
            << sim_->Control("call-waiting");
    }
    ~CallWaitingWindowTest() override {
        window_.reset();  // closes the link first, then the views go
        PortClose(link_);
    }

    bool WaitFor(const std::function<bool()>& done, int limitMs = 20000) {
        return testing::WaitPumping(done, milliseconds(limitMs));
    }
    // Presses a button of the page and waits for its exchange to end.
    void Press(int id) {
        auto* button = qobject_cast<QAbstractButton*>(FindControl(page_, id));
        ASSERT_NE(button, nullptr) << id;
        ASSERT_TRUE(button->isEnabled()) << id;
        button->click();
        EXPECT_TRUE(page_->Busy());
        EXPECT_FALSE(button->isEnabled());  // no second request while one runs
        ASSERT_TRUE(WaitFor([&] { return !page_->Busy(); }));
        EXPECT_TRUE(button->isEnabled());
    }
    QString Shown() {
        auto* field = qobject_cast<QLineEdit*>(FindControl(page_, kWaitingStateId));
        return field ? field->text() : "<none>";
    }
    std::u16string Line(int id) {
        auto* label = qobject_cast<QLabel*>(FindControl(pad_, id));
        return label ? label->text().toStdU16String() : u"<none>";
    }
    void Snap(QWidget* widget, const char* name) {
        const char* shots = std::getenv("VQM_SCREENSHOTS");
        if (!shots) return;
        std::filesystem::create_directories(shots);
        window_->show();
        QApplication::processEvents();
        EXPECT_TRUE(
            widget->grab().save(QString::fromStdString(std::string(shots) + "/" + name + ".png")));
    }

    const testing::TempFolder temp_;
    SettingsStore settings_{temp_ / "settings.db"};
    Link link_{settings_, DriverRoots{temp_ / "run", temp_ / "tty"}};
    Dialogs dialogs_;
    std::vector<std::u16string> boxes_;
    ShellContext context_{settings_, link_, dialogs_, temp_ / "run"};
    SimCardHost host_{link_};
    std::unique_ptr<cardsim::CardSim> sim_;
    std::unique_ptr<MainWindow> window_;
    DialPadView* pad_ = nullptr;
    CallWaitingPage* page_ = nullptr;
};

TEST_P(CallWaitingWindowTest, ButtonsSendTheirCommandAndTheFieldShowsTheNetworksAnswer) {
    ASSERT_NE(page_, nullptr);
    EXPECT_EQ(Shown(), "Unknown");
    struct Step {
        int button;
        const char* shown;
        const char* card;  // the simulated card's report afterwards: setting, last command
    };
    const Step steps[] = {
        {kWaitingRequestId, "NOT ACTIVE", "OK off last=+CCWA=1,2,1"},
        {kWaitingActivateId, "ACTIVE", "OK on last=+CCWA=1,1,1"},
        {kWaitingDeactivateId, "NOT ACTIVE", "OK off last=+CCWA=1,0,1"},
    };
    for (const Step& step : steps) {
        Press(step.button);
        EXPECT_EQ(Shown(), step.shown) << step.button;
        EXPECT_EQ(sim_->Control("call-waiting"), step.card) << step.button;
    }
    // Switched from the network side, the page learns it when asked.
    ASSERT_EQ(sim_->Control("call-waiting off"), "OK");
    Press(kWaitingRequestId);
    EXPECT_EQ(Shown(), "NOT ACTIVE");
    EXPECT_TRUE(boxes_.empty());
    window_->Command(kCmdViewFirst + kViewSettings);
    if (auto* tabs =
            qobject_cast<QTabBar*>(FindControl(window_->ViewAt(kViewSettings), kSettingsTabId)))
        tabs->setCurrentIndex(kSettingsCallWaiting);
    Snap(window_.get(), GetParam() == cardsim::Dialect::Card ? "call_waiting_page_card"
                                                             : "call_waiting_page_standard");

    // A network that refuses: the box says so, and Request shows "Unknown".
    ASSERT_EQ(sim_->Control("call-waiting none"), "OK");
    Press(kWaitingActivateId);
    EXPECT_EQ(Shown(), "NOT ACTIVE");  // the network's setting did not change
    Press(kWaitingRequestId);
    EXPECT_EQ(Shown(), "Unknown");
    EXPECT_EQ(boxes_, (std::vector<std::u16string>{u"Cannot activate call waiting.",
                                                   u"Cannot read call waiting from the network."}));
}

TEST_P(CallWaitingWindowTest, ASecondCallerDuringACallShowsOnTheStatusLineAndTheCallGoesOn) {
    ASSERT_NE(pad_, nullptr);
    ASSERT_EQ(pad_->Dial(u"12345"), 1);
    ASSERT_TRUE(WaitFor([&] { return pad_->Pad().CallState() == kCallVoice; }));

    // Waiting off: the network turns the second caller away.
    EXPECT_EQ(sim_->Control("ring +447700900123"), "ERROR: a call is in progress");

    // Waiting on, switched from the page as a person would.
    Press(kWaitingActivateId);
    ASSERT_EQ(sim_->Control("call-waiting"), "OK on last=+CCWA=1,1,1");
    struct Caller {
        const char* ring;
        std::u16string shown;
    };
    // A hostile caller id stays text: no markup, no link.
    const Caller callers[] = {{"+447700900123", u"Waiting: +447700900123"},
                              {"<b>4412</b>", u"Waiting: <b>4412</b>"}};
    for (const Caller& caller : callers) {
        ASSERT_EQ(sim_->Control(std::string("ring ") + caller.ring), "OK");
        EXPECT_TRUE(WaitFor([&] { return Line(kStatusLine3Id) == caller.shown; }))
            << Utf16ToUtf8(Line(kStatusLine3Id));
        EXPECT_EQ(pad_->Pad().CallState(), kCallVoice);
        EXPECT_EQ(Line(kStatusLine1Id), u"Voice call");
        EXPECT_EQ(Line(kNumberDisplayId), u"12345");
        EXPECT_FALSE(pad_->Ring().Ringing());
        EXPECT_NE(sim_->Control("status").find("call=active number=12345"), std::string::npos);
        sim_->Control("caller-hangup");
    }
    auto* line = qobject_cast<QLabel*>(FindControl(pad_, kStatusLine3Id));
    EXPECT_EQ(line->textFormat(), Qt::PlainText);
    window_->Command(kCmdViewFirst + kViewDialPad);
    Snap(pad_, GetParam() == cardsim::Dialect::Card ? "dial_pad_waiting_card"
                                                    : "dial_pad_waiting_standard");
}

INSTANTIATE_TEST_SUITE_P(Dialects, CallWaitingWindowTest,
                         ::testing::Values(cardsim::Dialect::Card, cardsim::Dialect::Standard),
                         [](const auto& info) {
                             return info.param == cardsim::Dialect::Card ? "Card" : "Standard";
                         });

}  // namespace
}  // namespace vqm
