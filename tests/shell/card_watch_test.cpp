// The card watch, the card state and the busy indicator, against a scripted card manager and
// against the simulated card.
#include "shell/card_watch.h"

#include <gtest/gtest.h>

#include <deque>
#include <thread>

#include "cardsim/card_sim.h"
#include "cardsim/companion.h"
#include "shell/card_host.h"
#include "shell/messages.h"
#include "support/local_socket.h"
#include "support/settings_store.h"
#include "tests/common/temp_folder.h"
#include "tests/shell/scripted_card_host.h"

namespace vqm {
namespace {

// Records what the window was asked to do, in order.
class RecordingUi : public ShellUi {
  public:
    int MessageBox(const std::u16string& text, const std::u16string&, unsigned style) override {
        boxes.push_back(text);
        lastStyle = style;
        log.push_back("box");
        return boxAnswer;
    }
    void ShowStatus(const std::u16string& first, const std::u16string& second) override {
        statuses.push_back(first + u"|" + second);
    }
    void Foreground() override { log.push_back("foreground"); }
    void UpdateWindow() override {}
    void SetBusyLook(bool busy) override { log.push_back(busy ? "busy" : "idle"); }
    void SetTrayIcon(int icon) override { log.push_back("icon " + std::to_string(icon)); }
    void EnableViewButton(int index, bool enable) override {
        log.push_back((enable ? "enable " : "disable ") + std::to_string(index));
    }
    void ShowDialPad() override { log.push_back("dialpad"); }
    bool ShuttingDown() const override { return shuttingDown; }
    void SendToViews(unsigned msg, long, long) override {
        log.push_back("views " + std::to_string(msg));
    }

    int boxAnswer = kIdOk;
    bool shuttingDown = false;
    unsigned lastStyle = 0;
    std::vector<std::u16string> boxes, statuses;
    std::vector<std::string> log;
};

using ScriptedCard = testing::ScriptedCardHost;

class CardWatchTest : public ::testing::Test {
  protected:
    CardWatchTest() { watch_.SetCardState(1); }

    const testing::TempFolder temp_;
    SettingsStore settings_{temp_ / "settings.db"};
    AppState app_;
    RecordingUi ui_;
    ScriptedCard card_;
    BusyIndicator busy_{ui_};
    CardWatch watch_{app_, settings_, ui_, card_, busy_};
};

TEST_F(CardWatchTest, CardStateChangesInOrderAndOnlyOnce) {
    EXPECT_EQ(ui_.log, (std::vector<std::string>{"dialpad", "disable 1", "disable 4", "icon 108",
                                                 "views 2026"}));
    ui_.log.clear();
    watch_.SetCardState(1);  // the same state: nothing
    watch_.SetCardState(0);  // not a state
    watch_.SetCardState(3);
    EXPECT_TRUE(ui_.log.empty());
    watch_.SetCardState(2);
    EXPECT_EQ(ui_.log,
              (std::vector<std::string>{"enable 1", "enable 4", "icon 107", "views 2026"}));
    EXPECT_EQ(card_.closes, 1);  // only the drop to 1 closes the link
    watch_.SetCardState(1);
    EXPECT_EQ(card_.closes, 2);
}

TEST_F(CardWatchTest, ACompanionStillPoweringUpKeepsTheWatchWaiting) {
    card_.answers = {2, 2, 2, 1};
    card_.answer = 1;
    watch_.Tick();
    EXPECT_EQ(card_.sleeps, (std::vector<int>{5000, 5000, 5000}));
    EXPECT_EQ(card_.opens, 1);
    EXPECT_EQ(app_.cardState, 2);
    EXPECT_EQ(ui_.statuses, std::vector<std::u16string>{u"Initializing...|"});
    EXPECT_EQ(busy_.Count(), 0);
    // Connected: the next passes neither reopen nor show anything.
    watch_.Tick();
    EXPECT_EQ(card_.opens, 1);
    EXPECT_EQ(ui_.statuses.size(), 1u);
}

TEST_F(CardWatchTest, AnExitWhileTheCardPowersUpEndsTheWatchAfterOneWait) {
    card_.answers = {2, 2, 1};
    ui_.shuttingDown = true;
    watch_.Tick();
    EXPECT_EQ(card_.sleeps, std::vector<int>{5000});
    EXPECT_EQ(card_.opens, 0);
    EXPECT_TRUE(ui_.statuses.empty());
}

TEST_F(CardWatchTest, DecliningThePowerUpQuestionSuppressesItForTheRun) {
    ui_.boxAnswer = kIdCancel;
    watch_.Tick();
    ASSERT_EQ(ui_.boxes.size(), 1u);
    EXPECT_EQ(ui_.boxes[0],
              u"Tavro Card Phone 2.0 is not powered up, would you like to power it up now?");
    EXPECT_EQ(ui_.lastStyle, 0x40021u);
    watch_.Tick();
    watch_.Tick();
    EXPECT_EQ(ui_.boxes.size(), 1u);
    EXPECT_EQ(card_.opens, 0);
    // The card is in its slot but powered down: said once, however long it lasts.
    EXPECT_EQ(ui_.statuses, std::vector<std::u16string>{u"Card Phone is powered|down."});
}

TEST_F(CardWatchTest, AcceptingThePowerUpQuestionPowersUpAndConnects) {
    card_.answers = {0};
    card_.answer = 1;
    watch_.Tick();
    EXPECT_EQ(card_.sent, (std::vector<unsigned>{kMsgCardPowerQuery, kMsgCardPowerUp}));
    EXPECT_EQ(app_.cardState, 2);
}

TEST_F(CardWatchTest, PoweredDownByTheUserIsNeverAskedAbout) {
    const int32_t poweredDown = 1;
    SetSettingInt(settings_, u"DialPadPowerDown", &poweredDown);
    card_.present = 1;
    for (int i = 0; i < 3; ++i)
        watch_.Tick();
    EXPECT_TRUE(ui_.boxes.empty());
    EXPECT_EQ(ui_.statuses, std::vector<std::u16string>{u"Card Phone is powered|down."});
    // The card goes: the other status, also once.
    card_.present = 0;
    watch_.Tick();
    watch_.Tick();
    EXPECT_EQ(ui_.statuses, (std::vector<std::u16string>{u"Card Phone is powered|down.",
                                                         u"No Card Phone inserted.|"}));
}

TEST_F(CardWatchTest, NoCompanionOrNoCardSaysNoCardOnce) {
    card_.companion = false;
    card_.present = 0;
    watch_.Tick();
    watch_.Tick();
    EXPECT_EQ(ui_.statuses, std::vector<std::u16string>{u"No Card Phone inserted.|"});
    EXPECT_TRUE(card_.sent.empty());
}

TEST_F(CardWatchTest, LosingTheCardWhileConnectedDropsToNotConnected) {
    card_.answer = 1;
    watch_.Tick();
    ASSERT_EQ(app_.cardState, 2);
    ui_.log.clear();
    const int closes = card_.closes;
    card_.answer = 0;  // pulled
    watch_.Tick();
    EXPECT_EQ(app_.cardState, 1);
    EXPECT_EQ(card_.closes, closes + 1);
    EXPECT_EQ(ui_.log, (std::vector<std::string>{"dialpad", "disable 1", "disable 4", "icon 108",
                                                 "views 2026"}));
    EXPECT_TRUE(ui_.boxes.empty());  // the drop itself asks nothing
}

TEST_F(CardWatchTest, AFailedOpenStaysNotConnectedAndRetriesNextPass) {
    card_.answer = 1;
    card_.openWorks = 0;
    watch_.Tick();
    watch_.Tick();
    EXPECT_EQ(app_.cardState, 1);
    EXPECT_EQ(card_.opens, 2);
    EXPECT_EQ(busy_.Count(), 0);
}

// The card out of its slot: the card manager refuses to power it, and the dialer neither
// opens the port nor covers the absence with "Initializing..." on every pass.
TEST_F(CardWatchTest, APowerUpRefusedForWantOfACardSaysNoCardOnce) {
    card_.present = 0;
    card_.powerUpAnswer = 0;
    for (int i = 0; i < 3; ++i)
        watch_.Tick();
    EXPECT_EQ(card_.opens, 0);
    EXPECT_EQ(ui_.statuses, std::vector<std::u16string>{u"No Card Phone inserted.|"});
    EXPECT_EQ(busy_.Count(), 0);
}

// Pulled while it was being initialised: said at once, and again after each later attempt,
// since "Initializing..." took the absence off the screen.
TEST_F(CardWatchTest, ACardPulledDuringTheHandshakeIsSaidToBeGoneAtOnce) {
    card_.answer = 1;
    card_.openWorks = 0;
    card_.present = 0;
    watch_.Tick();
    EXPECT_EQ(ui_.statuses,
              (std::vector<std::u16string>{u"Initializing...|", u"No Card Phone inserted.|"}));
    watch_.Tick();
    EXPECT_EQ(ui_.statuses.size(), 4u);
    EXPECT_EQ(ui_.statuses.back(), u"No Card Phone inserted.|");
    EXPECT_EQ(app_.cardState, 1);
}

TEST_F(CardWatchTest, BusyIndicatorNestsAcrossThreads) {
    ui_.log.clear();
    busy_.BeginBusy();
    std::thread worker([&] {
        busy_.BeginBusy();
        busy_.EndBusy();
    });
    worker.join();
    busy_.BeginBusy();
    busy_.EndBusy();
    EXPECT_EQ(busy_.Count(), 1);
    busy_.EndBusy();
    busy_.EndBusy();  // one too many: stays at 0
    EXPECT_EQ(busy_.Count(), 0);
    EXPECT_EQ(ui_.log, (std::vector<std::string>{"busy", "idle"}));
}

// The watch with the real card manager's socket, the real link and the simulated card.
TEST(CardWatchWithSimulatedCard, PowersUpConnectsAndNoticesThePulledCard) {
    const testing::TempFolder temp;
    SettingsStore settings(temp / "settings.db");
    SetSettingString(settings, u"PnpId", u"TAVRO_CARD_PHONE");
    cardsim::SimConfig config;
    config.baud = 0;
    config.runtimeDir = temp / "run";
    cardsim::CardSim sim(config);
    cardsim::Companion companion(sim, 0);
    LineServer server;
    const std::string path = WindowSocketPath(temp / "run", kCompanionClass);
    ASSERT_TRUE(server.Start(path, [&](const std::string& line) {
        return AnswerWindowMessage(line, [&](unsigned msg, long w, long l) {
            return companion.OnMessage(msg, w, l, cardsim::Clock::now());
        });
    }));

    Link link(settings, DriverRoots{temp / "run", temp / "no-tty"});
    LinkCardHost host(link, path);
    AppState app;
    RecordingUi ui;
    BusyIndicator busy(ui);
    CardWatch watch(app, settings, ui, host, busy);
    watch.SetCardState(1);
    watch.Tick();
    EXPECT_EQ(ui.boxes.size(), 1u);
    EXPECT_EQ(app.cardState, 2);
    EXPECT_GT(link.portState.load(), 0);  // open; the listener may be polling it

    sim.Control("pull");
    watch.Tick();
    EXPECT_EQ(app.cardState, 1);
    EXPECT_EQ(link.portState.load(), 0);
    EXPECT_EQ(ui.statuses.back(), u"No Card Phone inserted.|");
    EXPECT_EQ(ui.boxes.size(), 1u);  // losing the card is not a reason to ask
}

}  // namespace
}  // namespace vqm
