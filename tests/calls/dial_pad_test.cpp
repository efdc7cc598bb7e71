// The DialPad's logic without widgets: the number buffer, the dial exchange against the
// simulated card, the caller's number, the notification line and the tones.
#include "calls/dial_pad.h"

#include <gtest/gtest.h>

#include <atomic>
#include <chrono>
#include <cstring>
#include <filesystem>
#include <fstream>
#include <map>
#include <mutex>
#include <thread>
#include <vector>

#include "calls/alerts.h"
#include "calls/call_log.h"
#include "calls/event_log.h"
#include "calls/tones.h"
#include "calls/unsolicited.h"
#include "cardsim/card_sim.h"
#include "contacts/phonebook_cache.h"
#include "link/link.h"
#include "messaging/message_store.h"
#include "support/settings_store.h"
#include "support/text.h"
#include "tests/common/fake_card.h"
#include "tests/common/link_waits.h"
#include "tests/common/temp_folder.h"
#include "tests/common/wait.h"

namespace vqm {
namespace {

using std::chrono::milliseconds;
using Time = std::chrono::steady_clock::time_point;

std::u16string Typed(const std::u16string& keys, milliseconds gap) {
    DialNumber number;
    Time now{};
    for (char16_t c : keys) {
        now += gap;
        DialPadAppend(number, c, now);
    }
    return DialPadText(number);
}

TEST(DialNumberTest, QuickDoubleZeroTypesPlusAndASlowOneTwoZeros) {
    EXPECT_EQ(Typed(u"00", milliseconds(999)), u"+");
    EXPECT_EQ(Typed(u"00", milliseconds(1000)), u"00");
    EXPECT_EQ(Typed(u"0044", milliseconds(300)), u"+44");
    // Only a lone first "0" pairs: a "+" inside a number would dial something else.
    EXPECT_EQ(Typed(u"000", milliseconds(100)), u"+0");
    EXPECT_EQ(Typed(u"0000", milliseconds(100)), u"+00");
    EXPECT_EQ(Typed(u"07700900555", milliseconds(300)), u"07700900555");
    EXPECT_EQ(Typed(u"01100200", milliseconds(300)), u"01100200");
    EXPECT_EQ(Typed(u"5050", milliseconds(10)), u"5050");
}

TEST(DialNumberTest, TheTwentiethCharacterNeverAppears) {
    DialNumber number;
    const std::u16string keys = u"1234567890123456789ABCDEFG";
    int kept = 0;
    for (char16_t c : keys)
        kept += DialPadAppend(number, c, Time{} + std::chrono::hours(1));
    EXPECT_EQ(DialPadText(number), keys.substr(0, 19));
    EXPECT_EQ(kept, 19);  // the refused ones say so, for the pad to show it is full
    EXPECT_EQ(number.count, 20);
    // Taking one back makes room for exactly one more.
    EXPECT_EQ(DialPadBackspace(number), 1);
    DialPadAppend(number, u'X', Time{});
    DialPadAppend(number, u'Y', Time{});
    EXPECT_EQ(DialPadText(number), keys.substr(0, 18) + u"X");

    DialPadEmpty(number);
    EXPECT_EQ(DialPadText(number), u"");
    EXPECT_EQ(DialPadBackspace(number), 0);
    EXPECT_EQ(number.count, 1);
}

// The dial exchange against the simulated card on a pseudo-terminal.
class DialExchangeTest : public ::testing::Test {
  protected:
    void Open(const std::string& firmware, int dialDelayMs) {
        cardsim::SimConfig config;
        config.baud = 0;
        config.engine.firmware = firmware;
        config.engine.dialDelayMs = dialDelayMs;
        sim_ = std::make_unique<cardsim::CardSim>(config);
        ASSERT_TRUE(sim_->PowerUp());
        ASSERT_EQ(PortOpenDevice(link_, sim_->DevicePath().c_str()), 1);
    }
    ~DialExchangeTest() override { PortClose(link_); }

    // Runs the exchange on a thread of its own, as the DialPad does.
    std::thread Start(const char* number) {
        return std::thread([this, number] { result_ = DialExchange(link_, number, cancel_); });
    }
    // The dial is under way once the card reports it; false if that does not come.
    bool Dialling() {
        return testing::WaitFor(
            [&] { return sim_->Control("status").find("call=dialing") != std::string::npos; },
            milliseconds(10000));
    }
    // The listener's poll, queued behind a dial, may hold the port for a moment.
    bool PortGivenBack() {
        return testing::WaitFor([&] { return link_.portState.load() == 1; }, milliseconds(3000));
    }

    const testing::TempFolder temp_;
    SettingsStore settings_{temp_ / "settings.db"};
    Link link_{settings_, DriverRoots{temp_ / "run", temp_ / "tty"}};
    std::unique_ptr<cardsim::CardSim> sim_;
    std::atomic<int> cancel_{0};
    std::atomic<int> result_{-2};
};

TEST_F(DialExchangeTest, ResultsOfTheNetworkAreSearchedOnlyWithinTheCommandsLength) {
    Open("SW4.00", 50);
    EXPECT_EQ(DialExchange(link_, "+447700900123", cancel_), 0);
    char reply[256];
    AtCommand(link_, "ATH\r", reply, sizeof reply);
    ASSERT_EQ(sim_->Control("busy 0123456"), "OK");
    EXPECT_EQ(DialExchange(link_, "0123456", cancel_), 7);
    ASSERT_EQ(sim_->Control("unanswered 0123456"), "OK");
    EXPECT_EQ(DialExchange(link_, "0123456", cancel_), 8);
    // "ATD1;\r" is six bytes: "\r\nBUSY\r" does not fit in them, so no result is found.
    ASSERT_EQ(sim_->Control("busy 1"), "OK");
    EXPECT_EQ(DialExchange(link_, "1", cancel_), -1);
    // The port is free again after every exchange.
    EXPECT_TRUE(PortGivenBack());
}

TEST_F(DialExchangeTest, CancelEndsTheWaitOnNewFirmwareAndIsClearedAfterwards) {
    Open("SW4.00", 600000);
    std::thread dial = Start("0123456");
    const bool dialling = Dialling();
    cancel_.store(1);
    dial.join();
    ASSERT_TRUE(dialling);
    EXPECT_EQ(result_.load(), -1);
    EXPECT_EQ(cancel_.load(), 0);
    EXPECT_TRUE(PortGivenBack());

    // A cancel raised before the exchange starts is taken at once and cleared too.
    cancel_.store(1);
    EXPECT_EQ(DialExchange(link_, "0123456", cancel_), -1);
    EXPECT_EQ(cancel_.load(), 0);
}

TEST_F(DialExchangeTest, OldFirmwareWaitsForTheCardsAnswerDespiteACancel) {
    Open("SW3.80", 600000);
    std::thread dial = Start("0123456");
    const bool dialling = Dialling();
    cancel_.store(1);
    // Still waiting: the dial does not end within 400 ms of the cancel.
    const bool endedEarly =
        testing::WaitFor([&] { return result_.load() != -2; }, milliseconds(400));
    const std::string answered = sim_->Control("remote-answer");
    dial.join();
    ASSERT_TRUE(dialling);
    EXPECT_FALSE(endedEarly);
    ASSERT_EQ(answered, "OK");
    // The cancel noticed after the answer still turns the outcome into a failure.
    EXPECT_EQ(result_.load(), -1);
    EXPECT_EQ(cancel_.load(), 0);
}

TEST_F(DialExchangeTest, AClosedPortFailsTheDial) {
    EXPECT_EQ(DialExchange(link_, "0123456", cancel_), -1);
}

EventRecord ClipRecord(const char* text) {
    EventRecord record{};
    record.type = kEventCallerId;
    record.length = static_cast<uint8_t>(std::strlen(text));
    std::memcpy(record.text, text, record.length);
    return record;
}

TEST(CallerIdTest, TheNumberIsBareUpToFirmware381AndQuotedAfter) {
    char number[32];
    const EventRecord bare = ClipRecord("+CLIP: \t+447700900123,145");
    EXPECT_EQ(CallerIdNumber(bare, 3.80f, number, sizeof number), 13);
    EXPECT_STREQ(number, "+447700900123");
    EXPECT_EQ(CallerIdNumber(bare, 3.81f, number, sizeof number), 13);
    // Later firmware quotes the number: a bare one is no number at all.
    EXPECT_EQ(CallerIdNumber(bare, 4.0f, number, sizeof number), 0);
    EXPECT_STREQ(number, "");

    const EventRecord quoted = ClipRecord("+CLIP: \"01234\",129");
    EXPECT_EQ(CallerIdNumber(quoted, 4.0f, number, sizeof number), 5);
    EXPECT_STREQ(number, "01234");
    // A quoted number is read as such whatever the firmware (a modem that is not the card
    // reports version 0.0); an international type gives the '+' the number lacks.
    EXPECT_EQ(CallerIdNumber(quoted, 3.80f, number, sizeof number), 5);
    EXPECT_EQ(CallerIdNumber(ClipRecord("+CLIP: \"4915112345678\",145,,,,0"), 0.0f, number,
                             sizeof number),
              14);
    EXPECT_STREQ(number, "+4915112345678");

    // Never past the record's length or the caller's buffer.
    EventRecord cut = ClipRecord("+CLIP: 5551234");
    cut.length = 10;
    EXPECT_EQ(CallerIdNumber(cut, 3.80f, number, sizeof number), 3);
    EXPECT_STREQ(number, "555");
    char small[4];
    EXPECT_EQ(CallerIdNumber(bare, 3.80f, small, sizeof small), 3);
    EXPECT_STREQ(small, "+44");
    EXPECT_EQ(CallerIdNumber(ClipRecord("+CLIP:"), 3.80f, number, sizeof number), 0);
}

// A window-less DialPad for the notification line and the card-state reactions.
class FakeUi : public DialPadUi {
  public:
    void SetControlText(int id, const std::u16string& text) override { texts[id] = text; }
    std::u16string ControlText(int id) override { return texts[id]; }
    void EnableControl(int id, bool enable) override { enabled[id] = enable; }
    bool ControlEnabled(int id) override { return enabled[id]; }
    void SetSliderPosition(int position) override { slider = position; }
    int SliderPosition() override { return slider; }
    void SetSignalBars(int value) override { bars = value; }
    void ShowNotificationIcon(bool show) override { icon = show; }
    void StartTimer(int id, int) override { timers[id] = true; }
    void StopTimer(int id) override { timers[id] = false; }
    void SwitchToView(int index) override { views.push_back(index); }
    void ShowDialPad() override { views.push_back(0); }
    void BringDialPadForward() override { views.push_back(0); }
    void ShowStatus(const std::u16string& a, const std::u16string& b) override {
        texts[kStatusLine1Id] = a;
        texts[kStatusLine2Id] = b;
    }
    void DisplayOnIfOff() override {}
    void PostNotification(const std::u16string& body, const std::u16string& sound) override {
        posted.push_back(body);
        this->sound = sound;
    }
    void StartRingTone() override { ringing = true; }
    void StopRingTone() override { ringing = false; }
    bool CompanionExists() override { return companion; }
    std::optional<long> SendCompanion(unsigned msg) override {
        sent.push_back(msg);
        return powerAnswer;
    }
    long SendToDialPad(unsigned, long, long) override { return 0; }
    void PostToDialPad(unsigned, long, long) override {}
    void WaitWhileDelivering(const std::function<bool()>&) override {}

    std::map<int, std::u16string> texts;
    std::map<int, bool> enabled, timers;
    int slider = 0, bars = 0;
    bool icon = false, ringing = false, companion = false;
    std::vector<int> views;
    std::vector<std::u16string> posted;
    std::u16string sound;
    std::vector<unsigned> sent;
    long powerAnswer = 1;
};

class NoticeTest : public ::testing::Test {
  protected:
    NoticeTest() {
        const std::u16string folder = Utf8ToUtf16(temp_.Path() + "/");
        SetSettingString(settings_, u"InstallPath", folder.c_str());
    }
    std::u16string Line() { return ui_.texts[kNotificationLineId]; }

    const testing::TempFolder temp_;
    SettingsStore settings_{temp_ / "settings.db"};
    Link link_{settings_, DriverRoots{temp_ / "run", temp_ / "tty"}};
    CallLog log_{settings_};
    PhonebookCaches caches_{settings_};
    FakeUi ui_;
    DialPad pad_{link_, settings_, log_, caches_, ui_};
};

// Whether the SIM is full is asked of the card on the dispatching thread (the listener's), not
// on the pad's, the window's: a burst of new messages held the window a third of a second each
// while a caller rang. Here the pad's thread finds the card gone, so what it shows was asked
// before.
TEST_F(NoticeTest, ANewMessageAsksTheCardBeforeItReachesThePadsThread) {
    cardsim::SimConfig config;
    config.baud = 0;
    cardsim::CardSim sim(config);
    ASSERT_TRUE(sim.PowerUp());
    // The SIM's own messages and a new one, in a memory of five places: full.
    ASSERT_EQ(sim.Control("deliver +447700900123 Hello"), "OK");
    ASSERT_EQ(sim.Control("capacity 5"), "OK");
    ASSERT_EQ(PortOpenDevice(link_, sim.DevicePath().c_str()), 1);
    EventLog queue(temp_ / "event.log");
    UnsolicitedEvents events(queue);
    InstallCallHandlers(events, pad_, [&](const std::function<void()>& work) {
        PortClose(link_);
        work();
    });
    static const char kNewMessage[] = "+CMTI: \"SM\",3";
    events.DispatchEvent(MakeEventRecord(kEventNewMessage, kNewMessage,
                                         kNewMessage + sizeof kNewMessage - 1,
                                         std::chrono::system_clock::now()));
    EXPECT_NE(Line().find(u"SIM Full"), std::u16string::npos) << Utf16ToUtf8(Line());
    EXPECT_EQ(IndexListContains(settings_, kNewIdx, 3), 1);
}

// A burst of new messages asks the card once whether the SIM is full, and again only when the
// places counted since come to full; a message after the burst asks afresh.
TEST_F(NoticeTest, ABurstOfNewMessagesAsksTheCardOnceUnlessItFills) {
    // The places the card reports taken, one answer per question (the last one stays).
    std::mutex mutex;
    std::vector<int> answers = {5};
    int asked = 0;
    testing::FakeCard card([&](const std::string& command) -> std::string {
        if (command.rfind("AT+CPMS=", 0) != 0) return "\r\nOK\r\n";
        std::lock_guard<std::mutex> lock(mutex);
        ++asked;
        const std::string used = std::to_string(answers.front());
        if (answers.size() > 1) answers.erase(answers.begin());
        return "\r\n+CPMS: " + used + ",10," + used + ",10," + used + ",10\r\n\r\nOK\r\n";
    });
    testing::ShortenLinkWaits(link_);
    ASSERT_EQ(PortOpenDevice(link_, card.Device().c_str()), 1);
    EventLog queue(temp_ / "event.log");
    UnsolicitedEvents events(queue);
    InstallCallHandlers(events, pad_, [](const std::function<void()>& work) { work(); });
    auto burst = [&](std::initializer_list<int> locations, std::vector<int> replies) {
        {
            std::lock_guard<std::mutex> lock(mutex);
            answers = std::move(replies);
            asked = 0;
        }
        for (int location : locations) {
            const std::string line = "+CMTI: \"SM\"," + std::to_string(location);
            queue.EventLogAppend(MakeEventRecord(kEventNewMessage, line.data(),
                                                 line.data() + line.size(),
                                                 std::chrono::system_clock::now()));
        }
        events.DispatchQueued();
        std::lock_guard<std::mutex> lock(mutex);
        return asked;
    };
    // Three new messages in a store of ten with five taken: asked once, no alert.
    EXPECT_EQ(burst({3, 4, 5}, {5}), 1);
    EXPECT_EQ(Line().find(u"SIM Full"), std::u16string::npos) << Utf16ToUtf8(Line());
    // Five more, the last three still arriving when the card is first asked (eight taken): the
    // count comes to ten at the third, where the card is asked again and says full, and so on.
    EXPECT_EQ(burst({6, 7, 8, 9, 10}, {8, 10}), 4);
    EXPECT_NE(Line().find(u"SIM Full"), std::u16string::npos) << Utf16ToUtf8(Line());
    EXPECT_EQ(IndexListCount(settings_, kNewIdx), 8);
    // After the burst a new message asks afresh.
    EXPECT_EQ(burst({11}, {9}), 1);
    PortClose(link_);
}

TEST_F(NoticeTest, UnansweredCallsAreCountedAndAFullSimStaysNamedBesideThem) {
    NotifyUnansweredCall(pad_);
    EXPECT_EQ(Line(), u"1 unanswered call");
    EXPECT_TRUE(ui_.icon);
    NotifyUnansweredCall(pad_);
    EXPECT_EQ(Line(), u"2 unanswered calls");
    ASSERT_EQ(ui_.posted.size(), 2u);
    EXPECT_EQ(ui_.posted[1],
              u"<html><body>You have 2 unanswered calls.<p><a href=\"cmd:2002\">Open "
              u"DialPad</a></body></html>");
    EXPECT_EQ(ui_.sound, Utf8ToUtf16(temp_.Path() + "/Alarm1.wav"));

    NotifySimFull(pad_, 1);
    EXPECT_EQ(Line(), u"SIM Full");
    EXPECT_EQ(ui_.posted.back(),
              u"<html><body>SIM Full.<p><a href=\"cmd:2002\">Open DialPad</a></body></html>");
    NotifyNewMessages(pad_, 1, 3);
    EXPECT_EQ(Line(), u"3 new SMS/SIM Full");
    // Joined once, the full SIM goes on being named.
    NotifyUnansweredCall(pad_);
    EXPECT_EQ(Line(), u"3 unanswered calls/SIM Full");
    // Clearing the message notice leaves the full SIM.
    NotifyNewMessages(pad_, 1, 4);
    NotifyNewMessages(pad_, 0, 0);
    EXPECT_EQ(Line(), u"SIM Full");

    ui_.companion = true;
    NotifySimFull(pad_, 0);
    EXPECT_EQ(Line(), u"");
    EXPECT_FALSE(ui_.icon);
    EXPECT_EQ(ui_.sent, std::vector<unsigned>{2029});
    // Without the full SIM before it, a notice stands alone.
    NotifyNewMessages(pad_, 1, 1);
    EXPECT_EQ(Line(), u"1 new SMS");
}

TEST_F(NoticeTest, OneQuietRequestSuppressesExactlyOneDesktopNotification) {
    const int32_t one = 1;
    SetSettingInt(settings_, u"CeNFMessageAlert", &one);
    NotifyUnansweredCall(pad_);
    EXPECT_TRUE(ui_.posted.empty());
    EXPECT_EQ(Line(), u"1 unanswered call");  // the line itself still shows
    int32_t value = -1;
    ASSERT_EQ(GetSettingInt(settings_, u"CeNFMessageAlert", &value), 1);
    EXPECT_EQ(value, 0);
    NotifyUnansweredCall(pad_);
    EXPECT_EQ(ui_.posted.size(), 1u);
}

TEST_F(NoticeTest, TappingTheNoticeOpensItsListAndStartsTheCountAfresh) {
    NotifyUnansweredCall(pad_);
    NotifyUnansweredCall(pad_);
    ui_.views.clear();
    pad_.OnMessage(273, 2002, 0);
    EXPECT_EQ(ui_.views, std::vector<int>{5});
    EXPECT_EQ(Line(), u"");
    EXPECT_FALSE(ui_.icon);
    NotifyUnansweredCall(pad_);
    EXPECT_EQ(Line(), u"1 unanswered call");

    NotifyNewMessages(pad_, 1, 2);
    ui_.views.clear();
    pad_.OnMessage(273, 2002, 0);
    EXPECT_EQ(ui_.views, std::vector<int>{2});
    // Nothing up: a tap does nothing.
    ui_.views.clear();
    pad_.OnMessage(273, 2002, 0);
    EXPECT_TRUE(ui_.views.empty());
}

TEST_F(NoticeTest, CardLossGreysThePadAndThePowerKeyAsksTheCardManager) {
    NotifyUnansweredCall(pad_);
    pad_.OnMessage(2026, 1, 0);
    for (int id = kKeyZeroId; id <= kKeyContactsId; ++id)
        EXPECT_FALSE(ui_.enabled[id]) << id;
    EXPECT_FALSE(ui_.enabled[kVolumeSliderId]);
    EXPECT_EQ(Line(), u"");
    EXPECT_FALSE(ui_.timers[kTimerDialPad]);

    // Held for a second: with the card up, the manager is asked to power it down, once.
    ui_.companion = true;
    pad_.OnMessage(513, kPowerKeyId, 0);
    EXPECT_TRUE(ui_.timers[kTimerPowerKey]);
    pad_.OnMessage(275, kTimerPowerKey, 0);
    EXPECT_EQ(ui_.sent, (std::vector<unsigned>{2028, 2031}));
    EXPECT_FALSE(ui_.timers[kTimerPowerKey]);
    int32_t down = 0;
    GetSettingInt(settings_, u"DialPadPowerDown", &down);
    EXPECT_EQ(down, 1);
    // With the card down, up.
    ui_.sent.clear();
    ui_.powerAnswer = 0;
    pad_.OnMessage(513, kPowerKeyId, 0);
    pad_.OnMessage(275, kTimerPowerKey, 0);
    EXPECT_EQ(ui_.sent, (std::vector<unsigned>{2028, 2030}));
    // Let go before the second is up: nothing.
    ui_.sent.clear();
    pad_.OnMessage(513, kPowerKeyId, 0);
    pad_.OnMessage(514, kPowerKeyId, 0);
    EXPECT_FALSE(ui_.timers[kTimerPowerKey]);
}

TEST(ToneTest, GeneratedFilesArePlayableWavesOfWholeCycles) {
    for (Tone tone : {Tone::Ring1, Tone::Ring2, Tone::Music, Tone::Alarm1}) {
        const std::string file = ToneWavFile(tone);
        ASSERT_GT(file.size(), 44u) << ToneFileName(tone);
        auto le = [&](size_t at, int bytes) {
            uint32_t v = 0;
            for (int i = 0; i < bytes; ++i)
                v |= static_cast<uint32_t>(static_cast<unsigned char>(file[at + i])) << (8 * i);
            return v;
        };
        EXPECT_EQ(file.substr(0, 4), "RIFF");
        EXPECT_EQ(le(4, 4), file.size() - 8);
        EXPECT_EQ(file.substr(8, 8), "WAVEfmt ");
        EXPECT_EQ(le(20, 2), 1u);  // PCM
        EXPECT_EQ(le(22, 2), 1u);  // mono
        EXPECT_EQ(le(24, 4), static_cast<uint32_t>(kToneSampleRate));
        EXPECT_EQ(le(34, 2), 16u);
        EXPECT_EQ(file.substr(36, 4), "data");
        EXPECT_EQ(le(40, 4), file.size() - 44);
        // Loud somewhere, and a loop that starts and ends in silence does not click.
        int16_t peak = 0;
        for (size_t at = 44; at + 1 < file.size(); at += 2)
            peak = std::max<int16_t>(peak, static_cast<int16_t>(le(at, 2)));
        EXPECT_GT(peak, 8000);
        EXPECT_EQ(le(44, 2), 0u);
        EXPECT_EQ(le(file.size() - 2, 2), 0u);
    }
    // A ring cycle is about three seconds, so the ring repeats as a phone's does.
    const size_t ringSamples = ToneSamples(Tone::Ring1).size() / 2;
    EXPECT_NEAR(static_cast<double>(ringSamples) / kToneSampleRate, 3.0, 0.01);
}

TEST(ToneTest, MissingFilesAreMadeInTheInstallFolderAndSettingsResolveThere) {
    const testing::TempFolder temp;
    SettingsStore settings(temp / "settings.db");
    const std::string folder = temp / "install/";
    SetSettingString(settings, u"InstallPath", Utf8ToUtf16(folder).c_str());
    std::filesystem::create_directories(folder);
    std::ofstream(folder + "Ring2.wav") << "mine";
    EXPECT_EQ(EnsureToneFiles(settings), 3);  // the user's own Ring2.wav stays
    EXPECT_EQ(EnsureToneFiles(settings), 0);
    std::ifstream kept(folder + "Ring2.wav");
    std::string text;
    kept >> text;
    EXPECT_EQ(text, "mine");
    EXPECT_TRUE(std::filesystem::exists(folder + "Music.wav"));

    const std::u16string install = Utf8ToUtf16(folder);
    EXPECT_EQ(RingTonePath(settings), install + u"Ring1.wav");
    EXPECT_EQ(AlertTonePath(settings), install + u"Alarm1.wav");
    SetSettingString(settings, u"RingTonePath", u"<install folder>Music.wav");
    EXPECT_EQ(RingTonePath(settings), install + u"Music.wav");
    SetSettingString(settings, u"AlertTonePath", u"\\Windows\\Alarm1.wav");
    EXPECT_EQ(AlertTonePath(settings), install + u"Alarm1.wav");
    SetSettingString(settings, u"RingTonePath", u"/usr/share/sounds/bell.wav");
    EXPECT_EQ(RingTonePath(settings), u"/usr/share/sounds/bell.wav");
}

TEST(ToneTest, RingVolumeFollowsTheLevelAndClimbsWhenRaised) {
    EXPECT_FLOAT_EQ(RingVolume(3, 0, 0), 0.6f);
    EXPECT_FLOAT_EQ(RingVolume(9, 0, 0), 1.0f);
    EXPECT_FLOAT_EQ(RingVolume(-2, 0, 0), 0.0f);
    EXPECT_FLOAT_EQ(RingVolume(4, 1, 0), 0.2f);
    EXPECT_FLOAT_EQ(RingVolume(4, 1, 2), 0.6f);
    EXPECT_FLOAT_EQ(RingVolume(4, 1, 10), 0.8f);
    EXPECT_FLOAT_EQ(RingVolume(0, 1, 3), 0.0f);
}

}  // namespace
}  // namespace vqm
