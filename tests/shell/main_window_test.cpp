// The main window and its views on the offscreen platform, with a scripted card manager.
#include "shell/main_window.h"
#include "shell/view_factories.h"

#include <gtest/gtest.h>

#include <QAbstractButton>
#include <QAction>
#include <QApplication>
#include <QDialog>
#include <QLabel>
#include <filesystem>
#include <tuple>

#include "calls/dial_pad_view.h"
#include "cardsim/card_sim.h"
#include "link/link.h"
#include "shell/dialogs.h"
#include "shell/messages.h"
#include "shell/notifier.h"
#include "support/local_socket.h"
#include "support/settings_store.h"
#include "support/text.h"
#include "tests/common/sim_card_host.h"
#include "tests/common/temp_folder.h"
#include "tests/common/wait.h"
#include "tests/shell/scripted_card_host.h"

namespace vqm {
namespace {

// A view that notes which messages it got, and where it stands in the table.
class RecordingView : public View {
  public:
    RecordingView(QWidget* parent, int index, std::vector<std::pair<int, unsigned>>& log)
        : View(parent), index_(index), log_(log) {}
    long OnMessage(unsigned msg, long, long) override {
        log_.emplace_back(index_, msg);
        return 0;
    }

  private:
    int index_;
    std::vector<std::pair<int, unsigned>>& log_;
};

using FakeCard = testing::ScriptedCardHost;

class MainWindowTest : public ::testing::Test {
  protected:
    MainWindowTest() {
        dialogs_.SetResponder([this](const DialogRequest& request) {
            requests_.push_back(request.text);
            return answer_;
        });
    }
    std::unique_ptr<MainWindow> Make(int failingView = -1) {
        std::array<ViewFactory, kViewCount> factories;
        for (int i = 0; i < kViewCount; ++i)
            factories[i] = [this, i, failingView](QWidget* parent, ShellContext&) -> View* {
                if (i == failingView) return nullptr;
                return new RecordingView(parent, i, log_);
            };
        auto window = std::make_unique<MainWindow>(context_, factories, &card_);
        window->StopWatchTimer();
        return window;
    }
    int Count(int view, unsigned msg) const {
        return static_cast<int>(std::count(log_.begin(), log_.end(), std::make_pair(view, msg)));
    }

    const testing::TempFolder temp_;
    SettingsStore settings_{temp_ / "settings.db"};
    Link link_{settings_, DriverRoots{temp_ / "run", temp_ / "tty"}};
    Dialogs dialogs_;
    ShellContext context_{settings_, link_, dialogs_, temp_ / "run"};
    FakeCard card_;
    int answer_ = kIdCancel;
    std::vector<std::u16string> requests_;
    std::vector<std::pair<int, unsigned>> log_;
};

TEST_F(MainWindowTest, ViewsAreCreatedInOrderUntilTheFirstFailure) {
    auto window = Make(3);
    for (int i = 0; i < 3; ++i) {
        ASSERT_NE(window->ViewAt(i), nullptr);
        EXPECT_EQ(window->ViewAt(i)->objectName().toStdString(),
                  std::vector<std::string>({"DIALPAD_VIEW", "WRITESMS_VIEW", "SMSFOLDER_VIEW"})[i]);
    }
    for (int i = 3; i < kViewCount; ++i) EXPECT_EQ(window->ViewAt(i), nullptr);
    EXPECT_EQ(window->objectName(), "DIALERAPP_CLASS");
    EXPECT_EQ(window->windowTitle(), "VQM Dialer v 2.01");
    // The views fill the window but the 26-pixel menu bar.
    EXPECT_EQ(window->ViewAt(0)->geometry(), QRect(0, 0, 240, 320 - 26));
}

TEST_F(MainWindowTest, SwitchingViewsShowsOnceAndIgnoresTheCurrentAndTheImpossible) {
    auto window = Make();
    // Shown when created, and again as the start-up card state (1) brings DialPad forward.
    EXPECT_EQ(Count(0, kMsgViewShown), 2);
    window->Command(kCmdViewFirst + 2);  // SMS Folder
    EXPECT_EQ(Count(2, kMsgViewShown), 1);
    EXPECT_TRUE(window->Buttons()[2]->isChecked());
    EXPECT_FALSE(window->ViewAt(0)->isVisible() && window->isVisible());
    window->Command(kCmdViewFirst + 2);  // already current: no second 2025
    EXPECT_EQ(Count(2, kMsgViewShown), 1);

    ViewSet& views = window->Views();
    views.current = 9;  // outside the table: nothing changes
    const auto before = log_.size();
    ShowView(views);
    EXPECT_EQ(log_.size(), before);
    EXPECT_FALSE(window->ViewAt(2)->isHidden());
}

TEST_F(MainWindowTest, CardStateGreysButtonsBringsDialPadForwardAndTellsEveryView) {
    auto window = Make();
    EXPECT_EQ(window->App().cardState, 1);
    EXPECT_FALSE(window->Buttons()[1]->isEnabled());
    EXPECT_FALSE(window->Buttons()[4]->isEnabled());
    EXPECT_EQ(window->TrayIconId(), kIconNotConnected);

    window->Watch().SetCardState(2);
    EXPECT_TRUE(window->Buttons()[1]->isEnabled());
    EXPECT_TRUE(window->Buttons()[4]->isEnabled());
    EXPECT_EQ(window->TrayIconId(), kIconConnected);

    window->Command(kCmdViewFirst + 4);
    log_.clear();
    window->Watch().SetCardState(1);
    EXPECT_EQ(window->Views().current, 0);
    EXPECT_TRUE(window->Buttons()[0]->isChecked());
    EXPECT_FALSE(window->Buttons()[1]->isEnabled());
    // DialPad shown first, then 2026 to the seven views in table order.
    std::vector<std::pair<int, unsigned>> expected{{0, kMsgViewShown}};
    for (int i = 0; i < kViewCount; ++i) expected.emplace_back(i, kMsgCardStateChanged);
    EXPECT_EQ(log_, expected);
}

TEST_F(MainWindowTest, ForwardsListenerAndRefreshMessagesToTheirViews) {
    auto window = Make();
    log_.clear();
    std::thread listener([&] { window->Messages().Send(window.get(), kMsgCallActive, 0, 0); });
    window->Messages().WaitWhileDelivering([&] { return Count(0, kMsgCallActive) == 1; });
    listener.join();
    window->OnMessage(kMsgRefreshLists, 0, 0);
    EXPECT_EQ(log_, (std::vector<std::pair<int, unsigned>>{
                        {0, kMsgCallActive}, {2, kMsgRefreshLists}, {5, kMsgRefreshLists}}));
}

TEST_F(MainWindowTest, MenuCommandsAndTheBoxesTheyShow) {
    auto window = Make();
    window->Command(kCmdWhatsThis);
    ASSERT_EQ(requests_.size(), 1u);
    EXPECT_EQ(requests_[0], u"Tavro Card Phone Dialer is opened, and no other applications can "
                            u"open the communication port of Tavro Card Phone 2.0 now.");
    // No DPMS offscreen: "Off Display" does nothing and the key is not bound.
    EXPECT_EQ(window->App().displayPowerSupported, 0);
    window->Command(kCmdOffDisplay);
    EXPECT_EQ(window->App().displayOff, 0);

    dialogs_.SetResponder([&](const DialogRequest& request) {
        EXPECT_TRUE(request.isDialog);
        auto* program = qobject_cast<QLabel*>(FindControl(request.dialog, 1163));
        auto* firmware = qobject_cast<QLabel*>(FindControl(request.dialog, 1161));
        if (!program || !firmware) {
            ADD_FAILURE() << "the About box lacks control 1161 or 1163";
            return 2;
        }
        EXPECT_EQ(program->text(), "Tavro Card Phone Dialer v 2.01 for\r\nPocket PC (build 060302)");
        EXPECT_EQ(firmware->text(), "");  // no card: no firmware line
        requests_.push_back(u"about");
        return 1;
    });
    window->Command(kCmdAbout);
    EXPECT_EQ(requests_.back(), u"about");
}

TEST_F(MainWindowTest, NotificationTapBringsTheDialPadForward) {
    auto window = Make();
    window->Command(kCmdViewFirst + 5);
    log_.clear();
    window->Command(kCmdNotificationTapped);
    EXPECT_EQ(window->Views().current, 0);
    EXPECT_TRUE(window->Buttons()[0]->isChecked());
    EXPECT_EQ(log_, (std::vector<std::pair<int, unsigned>>{{0, kMsgViewShown}, {0, kWmCommand}}));
}

// What a person sees in each card state, kept as pictures next to the test.
TEST(MainWindowLook, ScreenshotsOfEachCardState) {
    const testing::TempFolder temp;
    SettingsStore settings(temp / "settings.db");
    Link link(settings, DriverRoots{temp / "run", temp / "tty"});
    Dialogs dialogs;
    dialogs.SetResponder([](const DialogRequest&) { return kIdCancel; });
    ShellContext context{settings, link, dialogs, temp / "run"};
    FakeCard card;
    MainWindow window(context, DefaultViewFactories(), &card);
    window.StopWatchTimer();
    window.show();
    const std::string folder = std::string(VQM_SCREENSHOT_DIR);
    std::filesystem::create_directories(folder);

    card.present = 0;
    window.Watch().Tick();
    QApplication::processEvents();
    auto* first = qobject_cast<QLabel*>(FindControl(window.ViewAt(0), 1144));
    ASSERT_NE(first, nullptr);
    EXPECT_EQ(first->text(), "No Card Phone inserted.");
    EXPECT_TRUE(window.grab().save(QString::fromStdString(folder + "/shell-no-card.png")));

    card.present = 1;
    window.Watch().Tick();  // declined once already: powered down, said once
    QApplication::processEvents();
    EXPECT_EQ(first->text(), "Card Phone is powered");
    EXPECT_TRUE(window.grab().save(QString::fromStdString(folder + "/shell-powered-down.png")));

    card.answer = 1;
    window.Watch().Tick();
    QApplication::processEvents();
    EXPECT_EQ(window.App().cardState, 2);
    // The DialPad takes over from the watch's "Initializing..." once the card is connected.
    EXPECT_EQ(first->text(), "Searching network...");
    EXPECT_TRUE(window.grab().save(QString::fromStdString(folder + "/shell-connected.png")));
}


// Exit during a call and after one, on both personalities of the card: every view, and the
// workers it joins, goes while the window's message layer and card host are still there. (Under
// the address sanitizer, a view waiting on a layer already gone is a use after free.)
enum class ExitMoment { DuringTheCall, AfterTheCall };
class MainWindowExitTest
    : public ::testing::TestWithParam<std::tuple<cardsim::Dialect, ExitMoment>> {};

TEST_P(MainWindowExitTest, TheViewsGoFirst) {
    const testing::TempFolder temp;
    SettingsStore settings(temp / "settings.db");
    SetSettingString(settings, u"InstallPath", Utf8ToUtf16(temp / "install").c_str());
    std::filesystem::create_directories(temp / "install");
    Link link(settings, DriverRoots{temp / "run", temp / "tty"});
    Dialogs dialogs;
    dialogs.SetResponder([](const DialogRequest&) { return kIdCancel; });
    ShellContext context{settings, link, dialogs, temp / "run"};
    cardsim::SimConfig config;
    config.baud = 0;
    config.engine.dialect = std::get<0>(GetParam());
    config.engine.dialDelayMs = 200;
    config.engine.ringTimeoutMs = 600000;
    cardsim::CardSim sim(config);
    ASSERT_TRUE(sim.PowerUp());
    testing::SimCardHost host(link);
    host.device = sim.DevicePath();
    host.companion = true;

    auto window = std::make_unique<MainWindow>(context, DefaultViewFactories(), &host);
    window->StopWatchTimer();
    host.messages = &window->Messages();
    ASSERT_EQ(host.OpenLink(), 1);
    window->Watch().SetCardState(2);
    auto* pad = dynamic_cast<DialPadView*>(window->ViewAt(kViewDialPad));
    ASSERT_NE(pad, nullptr);
    ASSERT_EQ(pad->Dial(u"+447700900123"), 1);
    const auto pump = [] { QApplication::processEvents(QEventLoop::AllEvents, 20); };
    ASSERT_TRUE(testing::WaitFor(
        testing::PumpingFor(
            pump, [&] { return sim.Control("status").find("call=none") == std::string::npos; }),
        std::chrono::seconds(10)));
    if (std::get<1>(GetParam()) == ExitMoment::AfterTheCall) {
        auto waitState = [&](auto holds) {
            return testing::WaitFor(
                testing::PumpingFor(pump, [&] { return holds(pad->Pad().CallState()); }),
                std::chrono::seconds(10));
        };
        // The number is reachable: the far end answers by itself.
        ASSERT_TRUE(waitState([](int state) { return state == kCallVoice; }))
            << "state " << pad->Pad().CallState() << ", " << sim.Control("status");
        // End, as a person ends it: the call is over and its result shows.
        auto* end = qobject_cast<QAbstractButton*>(FindControl(pad, kKeyEndId));
        ASSERT_NE(end, nullptr);
        end->click();
        ASSERT_TRUE(waitState([](int state) { return state == kCallEnded || state == kCallIdle; }));
    }

    // The window's own parts go after the views: its members first of all, and then the
    // children made before the views (the notifier among them).
    int viewsGone = 0, goneFirst = 0;
    bool partsGone = false;
    QObject::connect(&window->Notifications(), &QObject::destroyed, [&] { partsGone = true; });
    MessageLayer* const layer = &window->Messages();
    for (int i = 0; i < kViewCount; ++i)
        if (View* view = window->ViewAt(i))
            QObject::connect(view, &QObject::destroyed, [&] {
                ++viewsGone;
                if (!partsGone && context.messages == layer && context.mainWindow) ++goneFirst;
            });
    window->Command(kCmdExit);  // hangs up, closes the link
    window.reset();
    EXPECT_EQ(viewsGone, kViewCount);
    EXPECT_EQ(goneFirst, kViewCount);
    EXPECT_EQ(context.messages, nullptr);
    EXPECT_EQ(context.mainWindow, nullptr);
    PortClose(link);
}

INSTANTIATE_TEST_SUITE_P(
    DialectsAndMoments, MainWindowExitTest,
    ::testing::Combine(::testing::Values(cardsim::Dialect::Card, cardsim::Dialect::Standard),
                       ::testing::Values(ExitMoment::DuringTheCall, ExitMoment::AfterTheCall)),
    [](const auto& info) {
        return std::string(std::get<0>(info.param) == cardsim::Dialect::Card ? "card"
                                                                             : "standard") +
               (std::get<1>(info.param) == ExitMoment::DuringTheCall ? "_during" : "_after");
    });

}  // namespace
}  // namespace vqm
