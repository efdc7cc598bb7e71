// The DialPad view in the main window on the offscreen platform, driven by its controls, with
// the simulated card in-process on a pseudo-terminal and the network side played through its
// control commands.
#include "calls/dial_pad_view.h"

#include <gtest/gtest.h>

#include <QAbstractButton>
#include <QAction>
#include <QApplication>
#include <QFontMetrics>
#include <QKeyEvent>
#include <QLabel>
#include <QSlider>
#include <QTimer>
#include <algorithm>
#include <chrono>
#include <cstdio>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <thread>

#include "cardsim/card_sim.h"
#include "link/link.h"
#include "shell/dialogs.h"
#include "shell/messages.h"
#include "shell/ui_log.h"
#include "support/local_socket.h"
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
    void Start(const std::string& firmware = "SW4.00", int dialDelayMs = 200, bool connect = true) {
        cardsim::SimConfig config;
        config.baud = 0;
        config.engine.firmware = firmware;
        config.engine.dialect = dialect_;
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
        if (!connect) return;
        ASSERT_EQ(host_.OpenLink(), 1);
        window_->Watch().SetCardState(2);
    }
    // The window on the screen and active, as a person has it.
    void ShowWindow() {
        window_->show();
        window_->activateWindow();
        ASSERT_TRUE(WaitFor([&] { return window_->isActiveWindow(); }, 5000));
    }
    bool PadHasFocus() { return QApplication::focusWidget() == pad_; }
    // The card has no call any more: the listener cannot report the old one as active once
    // the pad is idle again.
    bool CardIdle() {
        return WaitFor(
            [&] { return sim_->Control("status").find("call=none") != std::string::npos; });
    }
    // A key typed on the keyboard goes wherever the focus is, as it would for a person.
    void Press(Qt::Key key, const QString& text = {}) {
        QWidget* target = QApplication::focusWidget();
        ASSERT_NE(target, nullptr) << "no widget has the keyboard focus";
        QKeyEvent down(QEvent::KeyPress, key, Qt::NoModifier, text);
        QKeyEvent up(QEvent::KeyRelease, key, Qt::NoModifier, text);
        QApplication::sendEvent(target, &down);
        QApplication::sendEvent(target, &up);
    }
    void KeyType(const std::string& digits, milliseconds gap = milliseconds(1500)) {
        for (char c : digits) {
            now_ += gap;
            const Qt::Key key = c == '*'   ? Qt::Key_Asterisk
                                : c == '#' ? Qt::Key_NumberSign
                                           : static_cast<Qt::Key>(Qt::Key_0 + (c - '0'));
            Press(key, QString(QChar(c)));
        }
    }
    FittedText* Line(int id) { return dynamic_cast<FittedText*>(FindControl(pad_, id)); }
    // The whole text fits its line in the font it is drawn with.
    bool Fits(int id) {
        FittedText* line = Line(id);
        return line && QFontMetrics(line->ShownFont()).horizontalAdvance(line->text()) <=
                           line->contentsRect().width();
    }

    bool WaitFor(const std::function<bool()>& done, int limitMs = 20000) {
        return testing::WaitPumping(done, milliseconds(limitMs));
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
        // Pictures go where the run asks too, to be looked at.
        if (const char* shots = std::getenv("VQM_SCREENSHOTS")) {
            std::filesystem::create_directories(shots);
            EXPECT_TRUE(pad_->grab().save(
                QString::fromStdString(std::string(shots) + "/" + name + ".png")));
        }
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
    cardsim::Dialect dialect_ = cardsim::Dialect::Card;
    std::unique_ptr<MainWindow> window_;
    DialPadView* pad_ = nullptr;
    std::chrono::steady_clock::time_point now_ =
        std::chrono::steady_clock::time_point{} + std::chrono::hours(1);
};

// The calls themselves run on the card's own dialect and on a standard 27.007 modem.
class DialPadCallTest : public DialPadViewTest,
                        public ::testing::WithParamInterface<cardsim::Dialect> {
  protected:
    DialPadCallTest() { dialect_ = GetParam(); }
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

TEST_P(DialPadCallTest, AKnownCallerRingsIsAnsweredAndHangsUp) {
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

TEST_P(DialPadCallTest, ABusyNumberIsReportedAndCallRedialsTheNewestDialledNumber) {
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

TEST_P(DialPadCallTest, EndWhileDiallingCancelsTheDial) {
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

TEST_P(DialPadCallTest, ACallAnsweredOnTheCardMovesToVoiceCallAndIsLogged) {
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

// The far end hangs up and the next caller rings at once, before the listener's next look at
// the call list: the call ends on the pad, and the new caller rings there and can be answered.
TEST_P(DialPadCallTest, ACallerRingingAsTheFarEndHangsUpEndsTheCallAndRings) {
    Start();
    ASSERT_EQ(sim_->Control("ring 0555123"), "OK");
    ASSERT_TRUE(WaitFor([&] { return Ringing() && Text(kNumberDisplayId) == u"0555123"; }));
    ASSERT_EQ(sim_->Control("local-answer"), "OK");
    ASSERT_TRUE(WaitFor([&] { return State() == kCallVoice; }));
    ASSERT_EQ(sim_->Control("remote-hangup"), "OK");
    ASSERT_EQ(sim_->Control("ring 0555777"), "OK");
    ASSERT_TRUE(WaitFor([&] { return Ringing() && Text(kNumberDisplayId) == u"0555777"; }));
    Click(kKeyCallId);
    ASSERT_TRUE(WaitFor([&] { return State() == kCallVoice; }));
    EXPECT_NE(sim_->Control("status").find("call=active number=0555777"), std::string::npos);
    EXPECT_EQ(Logged(kCallLogAnswered), (std::vector<std::string>{"0555123", "0555777"}));
    EXPECT_TRUE(Logged(kCallLogUnanswered).empty());
}

// The new caller's own id came while the pad still talked and was passed over: the ring the
// call list reports brings that caller's number with it, so that neither the display nor the
// log keeps the caller before.
TEST_P(DialPadCallTest, ARingFoundByTheCallListShowsAndLogsItsOwnCaller) {
    Start();
    ASSERT_EQ(sim_->Control("ring 0555123"), "OK");
    ASSERT_TRUE(WaitFor([&] { return Ringing() && Text(kNumberDisplayId) == u"0555123"; }));
    ASSERT_EQ(sim_->Control("local-answer"), "OK");
    ASSERT_TRUE(WaitFor([&] { return State() == kCallVoice; }));
    {
        std::lock_guard<std::mutex> lock(link_.ringingMutex);
        link_.ringingNumber = "0555777";
    }
    window_->OnMessage(kMsgCallRinging, 0, 0);
    EXPECT_TRUE(Ringing());
    EXPECT_EQ(Text(kNumberDisplayId), u"0555777");
    Click(kKeyEndId);
    EXPECT_EQ(Logged(kCallLogAnswered), std::vector<std::string>{"0555123"});
    EXPECT_EQ(Logged(kCallLogUnanswered), std::vector<std::string>{"0555777"});
}

// An empty call list ends a ring without a hang-up: here the card still rings (as for a caller
// who rang again since the list was read), and the ring comes back on the pad.
TEST_P(DialPadCallTest, AnEmptyCallListEndsARingWithoutHangingUpOnTheCard) {
    Start();
    ASSERT_EQ(sim_->Control("ring 0555123"), "OK");
    ASSERT_TRUE(WaitFor([&] { return Ringing() && Text(kNumberDisplayId) == u"0555123"; }));
    window_->OnMessage(kMsgCallListEmpty, 0, 0);
    EXPECT_EQ(Text(kStatusLine1Id), u"Unanswered");
    EXPECT_EQ(Logged(kCallLogUnanswered), std::vector<std::string>{"0555123"});
    EXPECT_TRUE(WaitFor([&] { return Ringing(); }));
    EXPECT_NE(sim_->Control("status").find("call=incoming"), std::string::npos);
}

// A caller turned down with End, or gone by the time the call list is read: a repeat of its
// ring read before that (handed over late, as the event queue waits for the port, or read with
// the empty list) does not ring again nor log the caller twice; a ring read after the end is a
// new call.
TEST_P(DialPadCallTest, ARingReadBeforeTheRingEndedDoesNotRingAgain) {
    Start();
    static const char kRing[] = "+CRING: VOICE";
    const char* end = kRing + sizeof kRing - 1;
    // The caller gives up: the list comes up empty, the repeat read with it comes after.
    ASSERT_EQ(sim_->Control("ring 0555999"), "OK");
    ASSERT_TRUE(WaitFor([&] { return Ringing() && Text(kNumberDisplayId) == u"0555999"; }));
    auto readBefore = std::chrono::system_clock::now();
    ASSERT_EQ(sim_->Control("caller-hangup"), "OK");
    ASSERT_TRUE(WaitFor([&] { return State() == kCallEnded; }));
    OnIncomingCall(pad_->Pad(), MakeEventRecord(kEventRing, kRing, end, readBefore));
    EXPECT_EQ(State(), kCallEnded);
    EXPECT_EQ(Logged(kCallLogUnanswered), std::vector<std::string>{"0555999"});

    // Turned down with End.
    ASSERT_EQ(sim_->Control("ring 0555123"), "OK");
    ASSERT_TRUE(WaitFor([&] { return Ringing() && Text(kNumberDisplayId) == u"0555123"; }));
    readBefore = std::chrono::system_clock::now();
    Click(kKeyEndId);
    ASSERT_TRUE(CardIdle());
    OnIncomingCall(pad_->Pad(), MakeEventRecord(kEventRing, kRing, end, readBefore));
    EXPECT_EQ(State(), kCallEnded);
    EXPECT_EQ(Text(kStatusLine1Id), u"Unanswered");
    EXPECT_EQ(Logged(kCallLogUnanswered), (std::vector<std::string>{"0555999", "0555123"}));
    // (Once the hang-up's exchange has ended: the card takes it just before.)
    EXPECT_TRUE(WaitFor([&] {
        OnIncomingCall(pad_->Pad(),
                       MakeEventRecord(kEventRing, kRing, end, std::chrono::system_clock::now()));
        return Ringing();
    }));
}

// A caller id read before the ringing call's ring belongs to a call before it (the event queue
// hands it over late): it neither shows nor logs the ringing caller as gone. One read since the
// ring, with another number, is a new caller after one who gave up.
TEST_P(DialPadCallTest, ACallerIdReadBeforeTheRingIsNotThisCallers) {
    Start();
    const auto readBefore = std::chrono::system_clock::now();
    ASSERT_EQ(sim_->Control("ring 0555123"), "OK");
    ASSERT_TRUE(WaitFor([&] { return Ringing() && Text(kNumberDisplayId) == u"0555123"; }));
    static const char kClip[] = "+CLIP: \"0555999\",129";
    const char* end = kClip + sizeof kClip - 1;
    OnCallerId(pad_->Pad(), MakeEventRecord(kEventCallerId, kClip, end, readBefore));
    EXPECT_EQ(Text(kNumberDisplayId), u"0555123");
    EXPECT_TRUE(Logged(kCallLogUnanswered).empty());
    OnCallerId(pad_->Pad(),
               MakeEventRecord(kEventCallerId, kClip, end, std::chrono::system_clock::now()));
    EXPECT_EQ(Text(kNumberDisplayId), u"0555999");
    EXPECT_EQ(Logged(kCallLogUnanswered), std::vector<std::string>{"0555123"});
}

TEST_P(DialPadCallTest, ARingLeftUnansweredIsLoggedAndCounted) {
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

TEST_P(DialPadCallTest, TheCardStateSetsTheVolumeAndGreysThePad) {
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

TEST_F(DialPadViewTest, ThePadHasTheKeyboardWheneverItComesForward) {
    Start("SW4.00", 600000);
    ShowWindow();
    EXPECT_TRUE(PadHasFocus());
    KeyType("5");
    EXPECT_EQ(Text(kNumberDisplayId), u"5");

    // Away and back by the menu bar.
    window_->Buttons()[kViewCallLog]->trigger();
    EXPECT_FALSE(pad_->isVisible());
    window_->Buttons()[kViewDialPad]->trigger();
    EXPECT_TRUE(PadHasFocus());
    KeyType("7");
    EXPECT_EQ(Text(kNumberDisplayId), u"57");

    // The busy look of a connection takes the whole window's focus; it comes back.
    window_->SetBusyLook(true);
    window_->SetBusyLook(false);
    EXPECT_TRUE(PadHasFocus());
    // A box closed by its button.
    QTimer::singleShot(100, [] {
        if (QWidget* box = QApplication::activeModalWidget()) box->close();
    });
    window_->MessageBox(u"A question", u"VQM Dialer", 0);
    ASSERT_TRUE(WaitFor([&] { return PadHasFocus(); }, 5000));
    Press(Qt::Key_Backspace);
    EXPECT_EQ(Text(kNumberDisplayId), u"5");

    // A ring brings it forward from another view; Esc turns the caller down.
    window_->Buttons()[kViewCallLog]->trigger();
    ASSERT_EQ(sim_->Control("ring 0555123"), "OK");
    ASSERT_TRUE(WaitFor([&] { return Ringing(); }));
    EXPECT_TRUE(PadHasFocus());
    Press(Qt::Key_Escape);
    EXPECT_EQ(Text(kStatusLine1Id), u"Unanswered");
    ASSERT_TRUE(CardIdle());
    LetTheResultGo();

    // Make Call from the Call Log: Esc cancels the dial.
    window_->Buttons()[kViewCallLog]->trigger();
    ASSERT_EQ(DialFromAnywhere(context_, u"0123456"), 1);
    EXPECT_TRUE(PadHasFocus());
    ASSERT_TRUE(
        WaitFor([&] { return sim_->Control("status").find("call=dialing") != std::string::npos; }));
    Press(Qt::Key_Escape);
    ASSERT_TRUE(WaitFor([&] { return State() == kCallEnded; }));
    EXPECT_EQ(Text(kStatusLine1Id), u"Call could not be established");
    ASSERT_TRUE(CardIdle());
    LetTheResultGo();

    // The notification's tap.
    window_->Buttons()[kViewSettings]->trigger();
    window_->Command(kCmdNotificationTapped);
    EXPECT_TRUE(PadHasFocus());
}

TEST_F(DialPadViewTest, AfterThePowerUpQuestionTheKeyboardReachesThePad) {
    Start("SW4.00", 200, false);
    host_.companion = true;
    host_.power = 0;
    int asked = 0;
    dialogs_.SetResponder([&](const DialogRequest&) { return ++asked, 1; });
    ShowWindow();
    window_->Watch().Tick();
    EXPECT_EQ(asked, 1);
    ASSERT_EQ(window_->App().cardState, 2);
    EXPECT_TRUE(PadHasFocus());
    KeyType("3");
    EXPECT_EQ(Text(kNumberDisplayId), u"3");
}

TEST_F(DialPadViewTest, OnlyALoneFirstZeroTurnsIntoPlus) {
    Start();
    ShowWindow();
    // At a normal pace on the keyboard, a number with "00" inside.
    KeyType("07700900555", milliseconds(300));
    EXPECT_EQ(Text(kNumberDisplayId), u"07700900555");
    Press(Qt::Key_Escape);
    KeyType("01100200", milliseconds(300));
    EXPECT_EQ(Text(kNumberDisplayId), u"01100200");
    Press(Qt::Key_Escape);
    // The international prefix, by the keys and by the keyboard.
    Click(kKeyZeroId);
    now_ += milliseconds(400);
    Click(kKeyZeroId);
    KeyType("44", milliseconds(300));
    EXPECT_EQ(Text(kNumberDisplayId), u"+44");
    Press(Qt::Key_Escape);
    KeyType("00", milliseconds(999));
    EXPECT_EQ(Text(kNumberDisplayId), u"+");
}

TEST_F(DialPadViewTest, NineteenCharactersShowWholeAndTheTwentiethIsSignalled) {
    Start();
    ShowWindow();
    KeyType("4477009001234567890");  // 19 digits
    EXPECT_EQ(Text(kNumberDisplayId), u"4477009001234567890");
    EXPECT_TRUE(Fits(kNumberDisplayId));
    EXPECT_EQ(pad_->FullNumberSignals(), 0);
    Snap("dialpad-19-digits");
    // The 20th, by the keyboard and by the key: kept out, and the display says so.
    KeyType("1");
    EXPECT_EQ(Text(kNumberDisplayId), u"4477009001234567890");
    EXPECT_EQ(pad_->FullNumberSignals(), 1);
    EXPECT_TRUE(pad_->DisplayFlashing());
    Snap("dialpad-number-full");
    Click(kKeyHashId);
    EXPECT_EQ(pad_->FullNumberSignals(), 2);
    EXPECT_TRUE(WaitFor([&] { return !pad_->DisplayFlashing(); }, 5000));
    // Room again after a Clear: no signal for the 19th.
    Click(kKeyClearId);
    KeyType("9");
    EXPECT_EQ(pad_->FullNumberSignals(), 2);
    // A number of "+" and digits, the widest the pad types.
    Press(Qt::Key_Escape);
    KeyType("00", milliseconds(10));
    KeyType("888888888888888888");
    EXPECT_EQ(Text(kNumberDisplayId).size(), 19u);
    EXPECT_TRUE(Fits(kNumberDisplayId));
    Snap("dialpad-19-wide");
}

TEST_F(DialPadViewTest, EveryStatusTextFitsItsLineWhole) {
    Start();
    ShowWindow();
    struct Shown {
        const char16_t* first;
        const char16_t* second;
        const char* picture;
    };
    const Shown texts[] = {
        {u"Searching network...", u"", "status-searching"},
        {u"Dialing...", u"", "status-dialing"},
        {u"Voice call", u"", "status-voice-call"},
        {u"Call ended", u"", "status-call-ended"},
        {u"Call could not be established", u"", "status-not-established"},
        {u"Number is busy", u"", "status-busy"},
        {u"Number not answer", u"", "status-not-answer"},
        {u"Unanswered", u"", "status-unanswered"},
        {u"Incoming call", u"Alice Example", "status-incoming"},
        {u"Card Phone is powered", u"down.", "status-powered-down"},
        {u"No Card Phone inserted.", u"", "status-no-card"},
        {u"Initializing...", u"", "status-initializing"},
    };
    for (const Shown& shown : texts) {
        window_->ShowStatus(shown.first, shown.second);
        pad_->SetControlText(kStatusLine3Id, u"+447700900123456");
        EXPECT_EQ(Text(kStatusLine1Id), shown.first);
        EXPECT_TRUE(Fits(kStatusLine1Id)) << Utf16ToUtf8(shown.first);
        EXPECT_TRUE(Fits(kStatusLine2Id)) << Utf16ToUtf8(shown.second);
        EXPECT_TRUE(Fits(kStatusLine3Id));
        Snap(shown.picture);
    }
    // The lines end left of the antenna beside the gauge.
    for (int id : {kStatusLine1Id, kStatusLine2Id, kStatusLine3Id})
        EXPECT_LT(Line(id)->geometry().right(), 186);
}

TEST_F(DialPadViewTest, ClearAndBackspaceEditTheNumberShownAfterACall) {
    Start();
    ShowWindow();
    KeyType("0123456");
    Press(Qt::Key_Return);
    ASSERT_TRUE(WaitFor([&] { return State() == kCallVoice; }));
    Press(Qt::Key_Escape);
    EXPECT_EQ(Text(kStatusLine1Id), u"Call ended");
    ASSERT_TRUE(CardIdle());
    LetTheResultGo();
    EXPECT_EQ(Text(kNumberDisplayId), u"0123456");
    Click(kKeyClearId);
    EXPECT_EQ(Text(kNumberDisplayId), u"012345");
    // The edited number goes on being typed; 20 Backspaces empty it and no more.
    KeyType("9");
    EXPECT_EQ(Text(kNumberDisplayId), u"0123459");
    for (int i = 0; i < 20; ++i)
        Press(Qt::Key_Backspace);
    EXPECT_EQ(Text(kNumberDisplayId), u"");

    // A redial from the Dialed log shows a number the buffer never held.
    Press(Qt::Key_Escape);
    for (int i = 0; i < 6; ++i)
        Click(kKeyClearId);
    Click(kKeyCallId);
    EXPECT_EQ(Text(kNumberDisplayId), u"0123456");
    ASSERT_TRUE(WaitFor([&] { return State() == kCallVoice; }));
    Click(kKeyEndId);
    ASSERT_TRUE(CardIdle());
    LetTheResultGo();
    Click(kKeyClearId);
    EXPECT_EQ(Text(kNumberDisplayId), u"012345");
    // Yet after a dial the next digit starts a new number.
    Press(Qt::Key_Escape);
    KeyType("0123456");
    Press(Qt::Key_Return);
    ASSERT_TRUE(WaitFor([&] { return State() == kCallVoice; }));
    Press(Qt::Key_Escape);
    ASSERT_TRUE(CardIdle());
    LetTheResultGo();
    KeyType("8");
    EXPECT_EQ(Text(kNumberDisplayId), u"8");
}

TEST_F(DialPadViewTest, TheCallKeyIsGreyOnceTheCardManagerVanishesMidDial) {
    Start("SW4.00", 600000);
    ShowWindow();
    KeyType("0123456");
    Press(Qt::Key_Return);
    ASSERT_TRUE(
        WaitFor([&] { return sim_->Control("status").find("call=dialing") != std::string::npos; }));
    // The card manager is gone: the next look of the watch drops the card.
    window_->Watch().Tick();
    EXPECT_EQ(window_->App().cardState, 1);
    // The dial's failure may come before or after the pad hears the card is gone.
    ASSERT_TRUE(WaitFor([&] { return State() != kCallDialing; }));
    const int state = State();
    for (int id = kKeyZeroId; id <= kKeyContactsId; ++id)
        EXPECT_FALSE(FindControl(pad_, id)->isEnabled()) << id;
    // Neither the key nor the keyboard dials.
    Click(kKeyCallId);
    Press(Qt::Key_Return);
    EXPECT_EQ(Logged(kCallLogDialed), std::vector<std::string>{"0123456"});
    EXPECT_EQ(State(), state);
}

TEST_F(DialPadViewTest, TheUiLogHasOneLineForEachStatusLineShown) {
    const std::string path = temp_ / "ui.log";
    UiLog uiLog(path);
    context_.uiLog = &uiLog;
    Start();
    window_->ShowStatus(u"Card Phone is powered", u"down.");
    window_->ShowStatus(u"No Card Phone inserted.", u"");
    std::ifstream file(path);
    std::vector<std::string> statuses;
    for (std::string line; std::getline(file, line);) {
        EXPECT_EQ(line.find('|'), std::string::npos) << line;
        if (const size_t at = line.find(" status "); at != std::string::npos)
            statuses.push_back(line.substr(at + 8));
    }
    context_.uiLog = nullptr;
    const std::vector<std::string> tail(statuses.end() - std::min<size_t>(3, statuses.size()),
                                        statuses.end());
    EXPECT_EQ(tail, (std::vector<std::string>{"Card Phone is powered", "down.",
                                              "No Card Phone inserted."}));
}

TEST_P(DialPadCallTest, ACallTheCardAlreadyHasShowsAsAVoiceCallThatEndEnds) {
    Start("SW4.00", 200, false);
    ShowWindow();
    // The call comes up on the card before the dialer has the link.
    ASSERT_EQ(sim_->Control("ring 0555123"), "OK");
    ASSERT_EQ(sim_->Control("local-answer"), "OK");
    ASSERT_NE(sim_->Control("status").find("call=active"), std::string::npos);
    ASSERT_EQ(host_.OpenLink(), 1);
    window_->Watch().SetCardState(2);
    ASSERT_TRUE(WaitFor([&] { return State() == kCallVoice; }));
    EXPECT_EQ(Text(kStatusLine1Id), u"Voice call");
    Press(Qt::Key_Escape);
    EXPECT_EQ(Text(kStatusLine1Id), u"Call ended");
    EXPECT_TRUE(CardIdle());
}

INSTANTIATE_TEST_SUITE_P(Dialects, DialPadCallTest,
                         ::testing::Values(cardsim::Dialect::Card, cardsim::Dialect::Standard),
                         [](const ::testing::TestParamInfo<cardsim::Dialect>& info) {
                             return info.param == cardsim::Dialect::Card ? "card" : "standard";
                         });

}  // namespace
}  // namespace vqm
