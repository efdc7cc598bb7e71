// vqm-dialpad-bench: how quickly the DialPad reacts. (1) From the simulated card's ring (at the
// card's line rate) until "Incoming call" stands on the DialPad, over 20 rings: the ring reaches
// the dialer through the listener's once-a-second pass, so the floor is that pass, not the line.
// (2) From a key press (mouse press and release on the key) until the digit is painted in the
// number display. Runs on the offscreen platform unless told otherwise.
#include <QApplication>
#include <QLabel>
#include <QMouseEvent>
#include <algorithm>
#include <chrono>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <filesystem>
#include <thread>
#include <vector>

#include "calls/dial_pad_view.h"
#include "cardsim/card_sim.h"
#include "link/link.h"
#include "shell/dialogs.h"
#include "shell/messages.h"
#include "support/settings_store.h"
#include "support/text.h"

namespace {

using Clock = std::chrono::steady_clock;

double Ms(Clock::duration d) {
    return std::chrono::duration<double, std::milli>(d).count();
}

double Median(std::vector<double> values) {
    std::sort(values.begin(), values.end());
    const size_t n = values.size();
    return n % 2 ? values[n / 2] : (values[n / 2 - 1] + values[n / 2]) / 2;
}

void Report(const char* what, const std::vector<double>& ms) {
    std::printf("%-36s n=%-4zu median %8.2f ms   worst %8.2f ms\n", what, ms.size(), Median(ms),
                *std::max_element(ms.begin(), ms.end()));
}

class BenchCard : public vqm::CardHost {
  public:
    BenchCard(vqm::Link& link, std::string device) : link_(link), device_(std::move(device)) {}
    bool CompanionExists() override { return false; }
    std::optional<long> SendCompanion(unsigned) override { return std::nullopt; }
    int OpenLink() override { return vqm::PortOpenDevice(link_, device_.c_str()); }
    void CloseLink() override {
        std::atomic<bool> closed{false};
        std::thread closer([&] {
            vqm::PortClose(link_);
            closed = true;
        });
        if (messages) messages->WaitWhileDelivering([&] { return closed.load(); });
        closer.join();
    }
    int CardPresent() override { return 1; }
    void Sleep(int) override {}
    vqm::MessageLayer* messages = nullptr;

  private:
    vqm::Link& link_;
    std::string device_;
};

}  // namespace

int main(int argc, char** argv) {
    int rings = 20, presses = 200, baud = 19200;
    for (int i = 1; i < argc; ++i) {
        if (!std::strcmp(argv[i], "--rings") && i + 1 < argc) {
            rings = std::max(1, std::atoi(argv[++i]));
        } else if (!std::strcmp(argv[i], "--presses") && i + 1 < argc) {
            presses = std::max(1, std::atoi(argv[++i]));
        } else if (!std::strcmp(argv[i], "--baud") && i + 1 < argc) {
            baud = std::max(0, std::atoi(argv[++i]));
        } else {
            std::printf("Usage: vqm-dialpad-bench [--rings N] [--presses N] [--baud B]\n");
            return std::strcmp(argv[i], "--help") ? 2 : 0;
        }
    }
    if (qEnvironmentVariableIsEmpty("QT_QPA_PLATFORM")) qputenv("QT_QPA_PLATFORM", "offscreen");
    QApplication app(argc, argv);

    char folder[] = "/tmp/vqm-dialpad-bench-XXXXXX";
    if (!mkdtemp(folder)) return 1;
    const std::string root = folder;
    int status = 0;
    {
        vqm::SettingsStore settings(root + "/settings.db");
        SetSettingString(settings, u"InstallPath", vqm::Utf8ToUtf16(root + "/").c_str());
        vqm::cardsim::SimConfig config;
        config.baud = baud;
        config.engine.ringTimeoutMs = 600000;
        vqm::cardsim::CardSim sim(config);
        if (!sim.PowerUp()) return 1;
        vqm::Link link(settings, vqm::DriverRoots{root + "/run", root + "/tty"});
        vqm::Dialogs dialogs;
        vqm::ShellContext context{settings, link, dialogs, root + "/run"};
        BenchCard card(link, sim.DevicePath());
        std::array<vqm::ViewFactory, vqm::kViewCount> factories;
        factories[vqm::kViewDialPad] = [](QWidget* parent, vqm::ShellContext& c) -> vqm::View* {
            return new vqm::DialPadView(parent, c);
        };
        for (int i = 1; i < vqm::kViewCount; ++i)
            factories[i] = [](QWidget* parent, vqm::ShellContext&) {
                return new vqm::View(parent);
            };
        vqm::MainWindow window(context, factories, &card);
        window.StopWatchTimer();
        card.messages = &window.Messages();
        window.show();
        auto* pad = dynamic_cast<vqm::DialPadView*>(window.ViewAt(vqm::kViewDialPad));
        if (!pad || !card.OpenLink()) return 1;
        window.Watch().SetCardState(2);
        // The result's two seconds pass on a clock the bench moves on by hand.
        Clock::duration skipped{};
        pad->Pad().SetClock([&] { return Clock::now() + skipped; });
        auto* line1 = qobject_cast<QLabel*>(vqm::FindControl(pad, vqm::kStatusLine1Id));
        auto* display = qobject_cast<QLabel*>(vqm::FindControl(pad, vqm::kNumberDisplayId));
        auto pumpUntil = [&](const std::function<bool()>& done, int limitMs) {
            const auto until = Clock::now() + std::chrono::milliseconds(limitMs);
            while (!done() && Clock::now() < until)
                QApplication::processEvents(QEventLoop::AllEvents, 1);
            return done();
        };

        std::vector<double> ringMs;
        for (int i = 0; i < rings; ++i) {
            const auto start = Clock::now();
            sim.Control("ring +447700900123");
            if (!pumpUntil([&] { return line1->text() == "Incoming call"; }, 10000)) {
                std::fprintf(stderr, "ring %d never showed\n", i + 1);
                status = 1;
                break;
            }
            line1->repaint();
            ringMs.push_back(Ms(Clock::now() - start));
            // Back to idle before the next ring: the caller gives up (after ringing long enough
            // for the listener's pass to see the call), the pad shows the result, and its two
            // seconds are skipped.
            {
                const auto seen = Clock::now() + std::chrono::milliseconds(1500);
                pumpUntil([&] { return Clock::now() >= seen; }, 2000);
            }
            sim.Control("caller-hangup");
            pumpUntil([&] { return pad->Pad().CallState() == vqm::kCallEnded; }, 10000);
            skipped += std::chrono::milliseconds(vqm::kResultShowMs);
            pad->OnMessage(vqm::kWmTimer, vqm::kTimerDialPad, 0);
            // A pause of chance length, so the rings fall at every point of the listener's pass.
            const auto pause = Clock::now() + std::chrono::milliseconds(137 * (i % 7));
            pumpUntil([&] { return Clock::now() >= pause; }, 2000);
        }
        if (!ringMs.empty()) Report("ring -> \"Incoming call\" shown", ringMs);

        std::vector<double> keyMs;
        QWidget* key = vqm::FindControl(pad, vqm::kKeyZeroId + 7);
        const QPointF centre(key->width() / 2.0, key->height() / 2.0);
        for (int i = 0; i < presses; ++i) {
            pad->OnMessage(vqm::kWmCommand, vqm::kKeyEndId, 0);  // an empty number each time
            QApplication::processEvents();
            const auto start = Clock::now();
            QMouseEvent press(QEvent::MouseButtonPress, centre, key->mapToGlobal(centre),
                              Qt::LeftButton, Qt::LeftButton, Qt::NoModifier);
            QMouseEvent release(QEvent::MouseButtonRelease, centre, key->mapToGlobal(centre),
                                Qt::LeftButton, Qt::NoButton, Qt::NoModifier);
            QApplication::sendEvent(key, &press);
            QApplication::sendEvent(key, &release);
            display->repaint();
            if (display->text() != "7") {
                std::fprintf(stderr, "key press %d did not show its digit\n", i + 1);
                status = 1;
                break;
            }
            keyMs.push_back(Ms(Clock::now() - start));
        }
        if (!keyMs.empty()) Report("key press -> digit painted", keyMs);
        window.close();
    }
    std::error_code ignored;
    std::filesystem::remove_all(root, ignored);
    return status;
}
