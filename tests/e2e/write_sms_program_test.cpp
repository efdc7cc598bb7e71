// Writing messages end to end: the program's main window with all its views, on the simulated
// card in both personalities, with a tap on the line between them that keeps every byte the
// dialer sends. What the card was given is decoded by gammu's PDU code, an implementation
// independent of ours: "Hello" to two numbers is two SMS-SUBMITs with that text and those
// numbers and two entries on the Sent page; a Greek text goes as UCS2 and reads back the same;
// a draft is still on the Draft page after the window is made again.
#include <fcntl.h>
#include <gammu.h>
#include <gtest/gtest.h>
#include <poll.h>
#include <termios.h>
#include <unistd.h>

#include <QAbstractButton>
#include <QApplication>
#include <QTreeWidget>
#include <atomic>
#include <chrono>
#include <filesystem>
#include <mutex>
#include <thread>

#include "cardsim/card_sim.h"
#include "link/link.h"
#include "messaging/sms_folder.h"
#include "messaging/sms_folder_view.h"
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

// A pseudo-terminal the dialer opens as its card, joined byte for byte to the simulated card's
// own device; what the dialer writes is kept.
class LineTap {
  public:
    explicit LineTap(const std::string& cardDevice) {
        master_ = posix_openpt(O_RDWR | O_NOCTTY | O_NONBLOCK);
        if (master_ < 0 || grantpt(master_) != 0 || unlockpt(master_) != 0) return;
        device_ = ptsname(master_);
        // Held open so the master never sees the line hang up between the dialer's opens.
        holder_ = open(device_.c_str(), O_RDWR | O_NOCTTY);
        card_ = open(cardDevice.c_str(), O_RDWR | O_NOCTTY | O_NONBLOCK);
        for (int fd : {holder_, card_}) {
            termios raw{};
            if (fd < 0 || tcgetattr(fd, &raw) != 0) continue;
            cfmakeraw(&raw);
            tcsetattr(fd, TCSANOW, &raw);
        }
        if (holder_ >= 0 && card_ >= 0) relay_ = std::thread([this] { Run(); });
    }
    ~LineTap() {
        stop_ = true;
        if (relay_.joinable()) relay_.join();
        for (int fd : {master_, holder_, card_})
            if (fd >= 0) close(fd);
    }
    bool Ready() const { return relay_.joinable(); }
    const std::string& Device() const { return device_; }
    std::string Sent() {
        std::lock_guard<std::mutex> lock(mutex_);
        return sent_;
    }

  private:
    void Run() {
        char buffer[512];
        while (!stop_) {
            pollfd fds[2] = {{master_, POLLIN, 0}, {card_, POLLIN, 0}};
            if (poll(fds, 2, 20) <= 0) continue;
            if (fds[0].revents & POLLIN) {
                const ssize_t n = read(master_, buffer, sizeof buffer);
                if (n > 0) {
                    {
                        std::lock_guard<std::mutex> lock(mutex_);
                        sent_.append(buffer, static_cast<size_t>(n));
                    }
                    WriteAll(card_, buffer, n);
                }
            }
            if (fds[1].revents & POLLIN) {
                const ssize_t n = read(card_, buffer, sizeof buffer);
                if (n > 0) WriteAll(master_, buffer, n);
            }
        }
    }
    void WriteAll(int fd, const char* data, ssize_t size) {
        for (int tries = 0; size > 0 && tries < 1000 && !stop_; ++tries) {
            const ssize_t n = write(fd, data, static_cast<size_t>(size));
            if (n > 0) {
                data += n;
                size -= n;
            } else {
                pollfd out{fd, POLLOUT, 0};
                poll(&out, 1, 10);
            }
        }
    }

    int master_ = -1, holder_ = -1, card_ = -1;
    std::string device_;
    std::atomic<bool> stop_{false};
    std::mutex mutex_;
    std::string sent_;
    std::thread relay_;
};

// One message as gammu reads the PDU the dialer gave the card.
struct Decoded {
    bool submit = false;
    bool ucs2 = false;
    std::u16string number, text;
};

std::u16string FromGammu(const unsigned char* text) {
    std::u16string out;
    for (size_t i = 0; text[i] || text[i + 1]; i += 2)
        out.push_back(static_cast<char16_t>(text[i] << 8 | text[i + 1]));
    return out;
}

// Every "AT+CMGS=" the dialer sent, with the PDU behind its prompt decoded.
std::vector<Decoded> SubmittedMessages(const std::string& line) {
    std::vector<Decoded> messages;
    for (size_t at = line.find("AT+CMGS="); at != std::string::npos;
         at = line.find("AT+CMGS=", at + 1)) {
        const size_t start = line.find('\r', at);
        const size_t end = line.find('\x1A', start);
        if (start == std::string::npos || end == std::string::npos) break;
        const std::string pdu = line.substr(start + 1, end - start - 1);
        const size_t count = pdu.size() / 2;
        std::vector<unsigned char> bytes(count + 8, 0);
        Decoded decoded;
        GSM_SMSMessage sms;
        GSM_SetDefaultSMSData(&sms);
        size_t used = 0;
        if (DecodeHexBin(bytes.data(), reinterpret_cast<const unsigned char*>(pdu.data()),
                         pdu.size()) &&
            GSM_DecodePDUFrame(GSM_GetGlobalDebug(), &sms, bytes.data(), count, &used, TRUE) ==
                ERR_NONE) {
            decoded.submit = sms.PDU == SMS_Submit;
            decoded.ucs2 = sms.Coding == SMS_Coding_Unicode_No_Compression;
            decoded.number = FromGammu(sms.Number);
            decoded.text = FromGammu(sms.Text);
        }
        messages.push_back(decoded);
    }
    return messages;
}

class WriteSmsProgramTest : public ::testing::TestWithParam<cardsim::Dialect> {
  protected:
    WriteSmsProgramTest() {
        SetSettingString(settings_, u"InstallPath", Utf8ToUtf16(install_).c_str());
        std::filesystem::create_directories(install_);
        // On its very first run the Settings view gives the card the SIM-default centre, an
        // empty number, which leaves the simulated card nothing to send through: these tests
        // start as a dialer that has run before.
        const int32_t simDefault = 1;
        SetSettingInt(settings_, u"SettingsMessagesUseSIMDefault", &simDefault);
        dialogs_.SetResponder([this](const DialogRequest& request) {
            boxes_.push_back(Utf16ToUtf8(request.title + u": " + request.text));
            return kIdOk;
        });
    }
    ~WriteSmsProgramTest() override {
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
        tap_ = std::make_unique<LineTap>(sim_->DevicePath());
        ASSERT_TRUE(tap_->Ready());
        host_.device = tap_->Device();
        Open();
    }
    // The program's window with all its views, connected to the card unless told otherwise.
    void Open(bool connect = true) {
        window_ = std::make_unique<MainWindow>(context_, DefaultViewFactories(), &host_);
        window_->StopWatchTimer();
        host_.messages = &window_->Messages();
        if (connect) {
            ASSERT_EQ(host_.OpenLink(), 1);
            window_->Watch().SetCardState(2);
        }
        write_ = dynamic_cast<WriteSmsView*>(window_->ViewAt(kViewWriteSms));
        folder_ = dynamic_cast<SmsFolderView*>(window_->ViewAt(kViewSmsFolder));
        ASSERT_NE(write_, nullptr);
        ASSERT_NE(folder_, nullptr);
        window_->Command(kCmdViewFirst + kViewWriteSms);
    }
    void Close() {
        host_.CloseLink();
        window_.reset();
        host_.messages = nullptr;  // the window's message layer went with it
    }
    void Click(int id) {
        auto* button = qobject_cast<QAbstractButton*>(FindControl(write_, id));
        ASSERT_NE(button, nullptr) << id;
        button->click();
    }
    void Send(const std::u16string& recipients, const std::u16string& text) {
        write_->SetRecipients(recipients);
        write_->SetText(text);
        Click(kWriteSendId);
        ASSERT_TRUE(testing::WaitPumping([&] { return !write_->Sending(); }));
    }
    std::vector<std::u16string> Column(int page, int column) {
        std::vector<std::u16string> texts;
        QTreeWidget* list = folder_->List(page);
        for (int i = 0; list && i < list->topLevelItemCount(); ++i)
            texts.push_back(list->topLevelItem(i)->text(column).toStdU16String());
        return texts;
    }

    const testing::TempFolder temp_;
    const std::string install_ = temp_ / "install/";
    SettingsStore settings_{temp_ / "settings.db"};
    Link link_{settings_, DriverRoots{temp_ / "run", temp_ / "tty"}};
    Dialogs dialogs_;
    ShellContext context_{settings_, link_, dialogs_, temp_ / "run"};
    testing::SimCardHost host_{link_};
    std::unique_ptr<cardsim::CardSim> sim_;
    std::unique_ptr<LineTap> tap_;
    std::unique_ptr<MainWindow> window_;
    WriteSmsView* write_ = nullptr;
    SmsFolderView* folder_ = nullptr;
    std::vector<std::string> boxes_;
};

TEST_P(WriteSmsProgramTest, HelloToTwoNumbersIsTwoSubmitsAndTwoSentEntries) {
    Send(u"12345;Bob<+44 7700 900456>", u"Hello");
    EXPECT_EQ(boxes_, std::vector<std::string>{"VQM Dialer: Message has been sent."});
    const std::vector<Decoded> sent = SubmittedMessages(tap_->Sent());
    ASSERT_EQ(sent.size(), 2u) << tap_->Sent();
    const std::u16string numbers[] = {u"12345", u"+447700900456"};
    for (size_t i = 0; i < sent.size(); ++i) {
        EXPECT_TRUE(sent[i].submit);
        EXPECT_FALSE(sent[i].ucs2);
        EXPECT_EQ(sent[i].number, numbers[i]);
        EXPECT_EQ(sent[i].text, u"Hello");
    }
    EXPECT_EQ(Column(kPageSent, kColumnMessage), (std::vector<std::u16string>(2, u"Hello")));
}

TEST_P(WriteSmsProgramTest, AGreekTextGoesAsUcs2AndReadsBackTheSame) {
    const std::u16string greek = Utf8ToUtf16("Καλημέρα! Τα λέμε αύριο");
    Send(u"+302101234567", greek);
    const std::vector<Decoded> sent = SubmittedMessages(tap_->Sent());
    ASSERT_EQ(sent.size(), 1u);
    EXPECT_TRUE(sent[0].ucs2);
    EXPECT_EQ(sent[0].number, u"+302101234567");
    EXPECT_EQ(sent[0].text, greek);
    std::vector<SmsRecord> local;
    ASSERT_TRUE(StoreReadAll(folder_->Store(), kFolderLocal, &local));
    ASSERT_EQ(local.size(), 1u);
    EXPECT_EQ(MessageBodyText(local[0]), greek);
}

TEST_P(WriteSmsProgramTest, ADraftSurvivesARestart) {
    write_->SetText(u"Remember the milk");
    Click(kWriteDraftId);
    EXPECT_EQ(boxes_,
              std::vector<std::string>{"VQM Dialer: Message has been saved to Draft folder."});
    EXPECT_TRUE(SubmittedMessages(tap_->Sent()).empty());
    Close();
    Open(false);  // a draft needs no card to be shown either
    window_->Command(kCmdViewFirst + kViewSmsFolder);
    EXPECT_EQ(Column(kPageDraft, kColumnMessage),
              std::vector<std::u16string>{u"Remember the milk"});
}

INSTANTIATE_TEST_SUITE_P(BothPersonalities, WriteSmsProgramTest,
                         ::testing::Values(cardsim::Dialect::Card, cardsim::Dialect::Standard),
                         [](const auto& info) {
                             return info.param == cardsim::Dialect::Card ? "Card" : "Standard";
                         });

}  // namespace
}  // namespace vqm
