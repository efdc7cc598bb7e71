// The DialPad view in the main window on the offscreen platform, driven by its controls, with
// the simulated card in-process on a pseudo-terminal and the network side played through its
// control commands.
#include "calls/dial_pad_view.h"

#include <gtest/gtest.h>

#include <QAbstractButton>
#include <QApplication>
#include <QLabel>
#include <QSlider>
#include <chrono>
#include <cstdio>
#include <filesystem>
#include <thread>

#include "cardsim/card_sim.h"
#include "link/link.h"
#include "shell/dialogs.h"
#include "shell/messages.h"
#include "support/settings_store.h"
#include "support/text.h"
#include "tests/common/temp_folder.h"

namespace vqm {
namespace {

using std::chrono::milliseconds;

// The card manager's side for the window: the link opens on the simulated card's device and
// closes while the window keeps taking the listener's messages.
class SimCardHost : public CardHost {
  public:
    explicit SimCardHost(Link& link) : link_(link) {}
    bool CompanionExists() override { return false; }
    std::optional<long> SendCompanion(unsigned) override { return std::nullopt; }
    int OpenLink() override { return PortOpenDevice(link_, device.c_str()); }
    void CloseLink() override {
        if (!messages || !messages->OnOwnerThread()) return PortClose(link_);
        std::atomic<bool> closed{false};
        std::thread closer([&] {
            PortClose(link_);
            closed = true;
        });
        messages->WaitWhileDelivering([&] { return closed.load(); });
        closer.join();
    }
    int CardPresent() override { return 1; }
    void Sleep(int) override {}

    std::string device;
    MessageLayer* messages = nullptr;

  private:
    Link& link_;
};

constexpr char kKnownNumber[] = "+447700900123";

class DialPadViewTest : public ::testing::Test {
  protected:
    DialPadViewTest() {
        SetSettingString(settings_, u"InstallPath", Utf8ToUtf16(install_).c_str());
        std::filesystem::create_directories(install_);
    }
    ~DialPadViewTest() override {
        window_.reset();  // closes the link first, then the views go
        PortClose(link_);
    }

    // The card, the window with the DialPad, the link open and the card connected.
    void Start(const std::string& firmware = "SW4.00", int dialDelayMs = 200) {
        cardsim::SimConfig config;
        config.baud = 0;
        config.engine.firmware = firmware;
        config.engine.dialDelayMs = dialDelayMs;
        config.engine.ringTimeoutMs = 600000;
        sim_ = std::make_unique<cardsim::CardSim>(config);
        ASSERT_TRUE(sim_->PowerUp());
        host_.device = sim_->DevicePath();

        std::array<ViewFactory, kViewCount> factories;
        factories[kViewDialPad] = [](QWidget* parent, ShellContext& context) -> View* {
            return new DialPadView(parent, context);
        };
        for (int i = 1; i < kViewCount; ++i)
            factories[i] = [](QWidget* parent, ShellContext&) { return new View(parent); };
        window_ = std::make_unique<MainWindow>(context_, factories, &host_);
        window_->StopWatchTimer();
        host_.messages = &window_->Messages();
        pad_ = dynamic_cast<DialPadView*>(window_->ViewAt(kViewDialPad));
        ASSERT_NE(pad_, nullptr);
        pad_->Pad().SetClock([this] { return now_; });
        ASSERT_EQ(host_.OpenLink(), 1);
        window_->Watch().SetCardState(2);
    }

    bool WaitFor(const std::function<bool()>& done, int limitMs = 20000) {
        const auto until = std::chrono::steady_clock::now() + milliseconds(limitMs);
        while (!done() && std::chrono::steady_clock::now() < until) {
            QApplication::processEvents(QEventLoop::AllEvents, 20);
            std::this_thread::sleep_for(milliseconds(5));
        }
        return done();
    }
    void Pump(int ms) {
        const auto until = std::chrono::steady_clock::now() + milliseconds(ms);
        WaitFor([&] { return std::chrono::steady_clock::now() >= until; }, ms + 1000);
    }
    std::u16string Text(int id) {
        auto* label = qobject_cast<QLabel*>(FindControl(pad_, id));
        return label ? label->text().toStdU16String() : u"<none>";
    }
    void Click(int id) {
        auto* key = qobject_cast<QAbstractButton*>(FindControl(pad_, id));
        ASSERT_NE(key, nullptr) << id;
        key->click();
    }
    void Type(const std::string& digits) {
        for (char c : digits) {
            now_ += milliseconds(1500);
            Click(c == '*' ? kKeyStarId : c == '#' ? kKeyHashId : kKeyZeroId + (c - '0'));
        }
    }
    int State() { return pad_->Pad().CallState(); }
    // The two seconds of a result, on the test's clock, then the next timer tick.
    void LetTheResultGo() {
        now_ += milliseconds(kResultShowMs);
        pad_->OnMessage(kWmTimer, kTimerDialPad, 0);
    }
    std::vector<std::string> Logged(int log) {
        std::vector<std::string> numbers;
        CallLog callLog(settings_);
        for (const CallLogRecord& record : ReadCallLog(callLog, log))
            numbers.emplace_back(record.number);
        return numbers;
    }
    void Snap(const char* name) {
        const std::string folder = VQM_SCREENSHOT_DIR;
        std::filesystem::create_directories(folder);
        window_->show();
        QApplication::processEvents();
        EXPECT_TRUE(pad_->grab().save(QString::fromStdString(folder + "/" + name + ".png")));
    }
    // A SIM phonebook cache holding one contact.
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
    bool Ringing() { return State() == kCallRinging && Text(kStatusLine1Id) == u"Incoming call"; }

    const testing::TempFolder temp_;
    const std::string install_ = temp_ / "install/";
    SettingsStore settings_{temp_ / "settings.db"};
    Link link_{settings_, DriverRoots{temp_ / "run", temp_ / "tty"}};
    Dialogs dialogs_;
    ShellContext context_{settings_, link_, dialogs_, temp_ / "run"};
    SimCardHost host_{link_};
    std::unique_ptr<cardsim::CardSim> sim_;
    std::unique_ptr<MainWindow> window_;
    DialPadView* pad_ = nullptr;
    std::chrono::steady_clock::time_point now_ =
        std::chrono::steady_clock::time_point{} + std::chrono::hours(1);
};

TEST_F(DialPadViewTest, KeysTypeTheNumberWithItsLimitsAndAnEmptyCallDoesNothing) {
    Start();
    Click(kKeyZeroId);
    now_ += milliseconds(999);
    Click(kKeyZeroId);
    EXPECT_EQ(Text(kNumberDisplayId), u"+");
    Click(kKeyClearId);
    EXPECT_EQ(Text(kNumberDisplayId), u"");
    Click(kKeyZeroId);
    now_ += milliseconds(1001);
    Click(kKeyZeroId);
    EXPECT_EQ(Text(kNumberDisplayId), u"00");
    Click(kKeyEndId);
    EXPECT_EQ(Text(kNumberDisplayId), u"");

    Type("1234567890123456789012345");
    EXPECT_EQ(Text(kNumberDisplayId), u"1234567890123456789");
    Click(kKeyEndId);

    // Nothing typed and nothing ever dialled: the Call key has nothing to call.
    const std::u16string before = Text(kStatusLine1Id);
    Click(kKeyCallId);
    EXPECT_EQ(State(), kCallIdle);
    EXPECT_EQ(Text(kStatusLine1Id), before);
    EXPECT_TRUE(Logged(kCallLogDialed).empty());
}

TEST_F(DialPadViewTest, AKnownCallerRingsIsAnsweredAndHangsUp) {
    KnowContact(kKnownNumber, "Alice Example");
    Start();
    // The operator's name comes with the one-second timer.
    ASSERT_TRUE(WaitFor([&] { return Text(kStatusLine1Id) == u"COSMOTE"; }));
    Snap("dialpad-idle");

    ASSERT_EQ(sim_->Control(std::string("ring ") + kKnownNumber), "OK");
    ASSERT_TRUE(WaitFor([&] { return Ringing() && Text(kStatusLine3Id) == u"+447700900123"; }));
    EXPECT_EQ(Text(kStatusLine2Id), u"Alice Example");
    EXPECT_EQ(Text(kNumberDisplayId), u"+447700900123");
    EXPECT_TRUE(pad_->Ring().Ringing());
    EXPECT_EQ(window_->Views().current, kViewDialPad);
    Snap("dialpad-ringing");

    Click(kKeyCallId);
    ASSERT_TRUE(WaitFor([&] { return State() == kCallVoice; }));  // answered off the window
    EXPECT_EQ(Text(kStatusLine1Id), u"Voice call");
    EXPECT_FALSE(pad_->Ring().Ringing());
    EXPECT_EQ(Logged(kCallLogAnswered), std::vector<std::string>{kKnownNumber});
    EXPECT_NE(sim_->Control("status").find("call=active"), std::string::npos);
    Snap("dialpad-in-call");

    ASSERT_EQ(sim_->Control("remote-hangup"), "OK");
    ASSERT_TRUE(WaitFor([&] { return State() == kCallEnded; }));
    EXPECT_EQ(Text(kStatusLine1Id), u"Call ended");
    Snap("dialpad-call-ended");
    // Still showing just before the two seconds are up.
    now_ += milliseconds(kResultShowMs - 2);
    pad_->OnMessage(kWmTimer, kTimerDialPad, 0);
    EXPECT_EQ(State(), kCallEnded);
    LetTheResultGo();
    EXPECT_EQ(State(), kCallIdle);
    EXPECT_EQ(Text(kStatusLine1Id), u"COSMOTE");
    EXPECT_EQ(Text(kStatusLine3Id), u"");
}

TEST_F(DialPadViewTest, ABusyNumberIsReportedAndCallRedialsTheNewestDialledNumber) {
    Start();
    ASSERT_EQ(sim_->Control("busy 0123456"), "OK");
    Type("0123456");
    Click(kKeyCallId);
    EXPECT_EQ(State(), kCallDialing);
    EXPECT_EQ(Text(kStatusLine1Id), u"Dialing...");
    EXPECT_FALSE(FindControl(pad_, kKeyCallId)->isEnabled());
    ASSERT_TRUE(WaitFor([&] { return State() == kCallEnded; }));
    EXPECT_EQ(Text(kStatusLine1Id), u"Number is busy");
    EXPECT_TRUE(FindControl(pad_, kKeyCallId)->isEnabled());
    EXPECT_EQ(Logged(kCallLogDialed), std::vector<std::string>{"0123456"});
    LetTheResultGo();

    // End empties the number; Call then takes the newest Dialed entry.
    ASSERT_EQ(sim_->Control("reachable 0123456"), "OK");
    Click(kKeyEndId);
    Click(kKeyCallId);
    EXPECT_EQ(Text(kNumberDisplayId), u"0123456");
    ASSERT_TRUE(WaitFor([&] { return State() == kCallVoice; }));
    EXPECT_EQ(Text(kStatusLine1Id), u"Voice call");
    EXPECT_EQ(Logged(kCallLogDialed), (std::vector<std::string>{"0123456", "0123456"}));
    // The first digit after a dial starts a new number.
    Click(kKeyEndId);
    ASSERT_EQ(State(), kCallEnded);
    EXPECT_EQ(Text(kStatusLine1Id), u"Call ended");
    LetTheResultGo();
    Type("7");
    EXPECT_EQ(Text(kNumberDisplayId), u"7");
}

TEST_F(DialPadViewTest, EndWhileDiallingCancelsTheDial) {
    Start("SW4.00", 600000);
    Type("0123456");
    Click(kKeyCallId);
    ASSERT_TRUE(
        WaitFor([&] { return sim_->Control("status").find("call=dialing") != std::string::npos; }));
    Click(kKeyEndId);
    ASSERT_TRUE(WaitFor([&] { return State() == kCallEnded; }));
    EXPECT_EQ(Text(kStatusLine1Id), u"Call could not be established");
    EXPECT_TRUE(FindControl(pad_, kKeyCallId)->isEnabled());
    // The hang-up after the failure ends the card's dial too.
    ASSERT_TRUE(
        WaitFor([&] { return sim_->Control("status").find("call=none") != std::string::npos; }));
}

TEST_F(DialPadViewTest, ACallAnsweredOnTheCardMovesToVoiceCallAndIsLogged) {
    Start();
    ASSERT_EQ(sim_->Control("ring 0555123"), "OK");
    ASSERT_TRUE(WaitFor([&] { return Ringing() && Text(kNumberDisplayId) == u"0555123"; }));
    EXPECT_EQ(Text(kStatusLine2Id), u"");  // nobody we know
    ASSERT_EQ(sim_->Control("local-answer"), "OK");
    ASSERT_TRUE(WaitFor([&] { return State() == kCallVoice; }));
    EXPECT_EQ(Text(kStatusLine1Id), u"Voice call");
    EXPECT_FALSE(pad_->Ring().Ringing());
    EXPECT_EQ(Logged(kCallLogAnswered), std::vector<std::string>{"0555123"});
    EXPECT_TRUE(Logged(kCallLogUnanswered).empty());
}

TEST_F(DialPadViewTest, ARingLeftUnansweredIsLoggedAndCounted) {
    // Old firmware sends the caller's number unquoted.
    Start("SW3.80");
    ASSERT_EQ(sim_->Control("ring +3069123"), "OK");
    ASSERT_TRUE(WaitFor([&] { return Ringing() && Text(kNumberDisplayId) == u"+3069123"; }));
    // The caller rings on past the listener's next look at the call list: a call it never saw
    // ringing cannot end for it.
    Pump(1500);
    ASSERT_EQ(sim_->Control("caller-hangup"), "OK");
    ASSERT_TRUE(WaitFor([&] { return State() == kCallEnded; }));
    EXPECT_EQ(Text(kStatusLine1Id), u"Unanswered");
    EXPECT_FALSE(pad_->Ring().Ringing());
    EXPECT_EQ(Logged(kCallLogUnanswered), std::vector<std::string>{"+3069123"});
    EXPECT_EQ(Text(kNotificationLineId), u"1 unanswered call");
    EXPECT_TRUE(pad_->NotificationIconShown());
    Snap("dialpad-unanswered");

    // The notification's action opens the Call Log and the count starts again.
    window_->Command(kCmdNotificationTapped);
    EXPECT_EQ(window_->Views().current, kViewCallLog);
    EXPECT_EQ(Text(kNotificationLineId), u"");
}

TEST_F(DialPadViewTest, TheCardStateSetsTheVolumeAndGreysThePad) {
    Start();
    // No level stored: 4, written back, and the card set to it.
    int32_t level = -1;
    ASSERT_EQ(GetSettingInt(settings_, u"VolumeLevel", &level), 1);
    EXPECT_EQ(level, 4);
    auto* slider = qobject_cast<QSlider*>(FindControl(pad_, kVolumeSliderId));
    ASSERT_NE(slider, nullptr);
    EXPECT_EQ(slider->value(), 4);
    // The card is set off the window's thread; the window hears of it.
    auto cardVolume = [&](const char* expected) {
        return WaitFor([&] { return sim_->Control("status").find(expected) != std::string::npos; });
    };
    EXPECT_TRUE(cardVolume("volume=4"));

    // A stored 15 is used as 10 and left as it is.
    level = 15;
    SetSettingInt(settings_, u"VolumeLevel", &level);
    window_->Watch().SetCardState(1);
    EXPECT_FALSE(FindControl(pad_, kKeyZeroId + 5)->isEnabled());
    EXPECT_FALSE(slider->isEnabled());
    EXPECT_EQ(Text(kStatusLine1Id), u"");
    ASSERT_EQ(host_.OpenLink(), 1);
    window_->Watch().SetCardState(2);
    EXPECT_TRUE(FindControl(pad_, kKeyZeroId + 5)->isEnabled());
    EXPECT_EQ(Text(kStatusLine1Id), u"Searching network...");
    EXPECT_EQ(slider->value(), 10);
    EXPECT_TRUE(WaitFor([&] { return pad_->Pad().VolumeLevel() == 10; }));
    GetSettingInt(settings_, u"VolumeLevel", &level);
    EXPECT_EQ(level, 15);

    // A step of the slider reaches the card and is kept.
    slider->setValue(7);
    EXPECT_TRUE(WaitFor([&] { return pad_->Pad().VolumeLevel() == 7; }));
    EXPECT_TRUE(cardVolume("volume=7"));
}

}  // namespace
}  // namespace vqm
