// The Write SMS view's counter: from a key press in the message text to the counter showing
// the new count, painted, for a text that reaches 160 characters with that key (the longest a
// 7-bit message gets), and the same for a UCS2 text reaching 70. Offscreen. Target: under 16 ms,
// one frame.
#include <QApplication>
#include <QKeyEvent>
#include <QLabel>
#include <algorithm>
#include <chrono>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <filesystem>
#include <string>
#include <vector>

#include "bench/bench_card.h"
#include "link/link.h"
#include "messaging/write_sms_view.h"
#include "shell/dialogs.h"
#include "support/settings_store.h"
#include "support/text.h"

namespace {

using Clock = std::chrono::steady_clock;

double Ms(Clock::time_point start) {
    return std::chrono::duration<double, std::milli>(Clock::now() - start).count();
}

struct Figure {
    double median = 0, p90 = 0, worst = 0;
    std::string shown;
};

// Each round puts count - 1 characters in and times the key that makes count.
Figure KeyToCounter(vqm::WriteSmsView& view, char16_t unit, int count, int rounds) {
    auto* counter = qobject_cast<QLabel*>(vqm::FindControl(&view, vqm::kWriteCounterId));
    std::vector<double> times;
    Figure figure;
    for (int i = 0; i < rounds; ++i) {
        view.SetText(std::u16string(static_cast<size_t>(count - 1), unit));
        QApplication::processEvents();
        QKeyEvent key(QEvent::KeyPress, 0, Qt::NoModifier, QString(QChar(unit)));
        const auto start = Clock::now();
        QApplication::sendEvent(view.TextEdit(), &key);
        counter->repaint();
        times.push_back(Ms(start));
        figure.shown = counter->text().toStdString();
    }
    figure.median = vqm::bench::Median(times);
    std::sort(times.begin(), times.end());
    figure.p90 = times[times.size() * 9 / 10];
    figure.worst = times.back();
    return figure;
}

}  // namespace

int main(int argc, char** argv) {
    int rounds = 200;
    for (int i = 1; i < argc; ++i) {
        if (!std::strcmp(argv[i], "--rounds") && i + 1 < argc) {
            rounds = std::max(1, std::atoi(argv[++i]));
        } else {
            std::printf(
                "Usage: vqm-write-sms-bench [--rounds N]\n"
                "Times a key press in the Write SMS view's text to the counter painted with the\n"
                "new count, for a 160-character 7-bit and a 70-character UCS2 text (target under\n"
                "16 ms).\n");
            return std::strcmp(argv[i], "--help") ? 2 : 0;
        }
    }
    if (qEnvironmentVariableIsEmpty("QT_QPA_PLATFORM")) qputenv("QT_QPA_PLATFORM", "offscreen");
    QApplication app(argc, argv);
    char pattern[] = "/tmp/vqm-bench-XXXXXX";
    const char* made = mkdtemp(pattern);
    if (!made) return 1;
    const std::string folder = made;
    int status = 1;
    {
        vqm::SettingsStore settings(folder + "/settings.db");
        vqm::SetSettingString(settings, u"InstallPath", vqm::Utf8ToUtf16(folder + "/").c_str());
        vqm::Link link(settings, vqm::DriverRoots{folder + "/run", folder + "/tty"});
        vqm::Dialogs dialogs;
        vqm::ShellContext context{settings, link, dialogs, folder + "/run"};
        vqm::WriteSmsView view(nullptr, context);
        view.resize(240, 294);
        view.show();
        QApplication::processEvents();
        const Figure gsm = KeyToCounter(view, u'a', 160, rounds);
        const Figure ucs2 = KeyToCounter(view, u'\u03bb', 70, rounds);
        std::printf("%-26s %10s %10s %10s %10s\n", "key to counter", "median ms", "90th ms",
                    "worst ms", "shown");
        for (const auto& [name, figure] :
             {std::pair{"7-bit text reaching 160", gsm}, std::pair{"UCS2 text reaching 70", ucs2}})
            std::printf("%-26s %10.3f %10.3f %10.3f %10s\n", name, figure.median, figure.p90,
                        figure.worst, figure.shown.c_str());
        status =
            gsm.shown == "160/160" && ucs2.shown == "70/70" && gsm.median < 16 && ucs2.median < 16
                ? 0
                : 1;
    }
    std::error_code ignored;
    std::filesystem::remove_all(folder, ignored);
    return status;
}
