// Text from outside (caller ids, message bodies, names, operator names) shows as typed
// everywhere the dialer shows it: never read as markup, never an image of a local file, never a
// forged line in the ui log.
#include <gtest/gtest.h>

#include <QApplication>
#include <QLabel>
#include <QMessageBox>
#include <QTimer>
#include <filesystem>
#include <fstream>
#include <functional>
#include <sstream>
#include <string>
#include <utility>
#include <vector>

#include "calls/dial_pad.h"
#include "calls/dial_pad_view.h"
#include "contacts/manage_contacts_view.h"
#include "link/link.h"
#include "messaging/write_sms_view.h"
#include "shell/dialogs.h"
#include "shell/main_window.h"
#include "shell/ui_log.h"
#include "support/settings_store.h"
#include "tests/common/temp_folder.h"
#include "tests/shell/scripted_card_host.h"

namespace vqm {
namespace {

const std::u16string kHostile = u"<b>x</b><img src=\"file:///etc/passwd\"> &lt;<i>y";

// What a place showed: the label's text format and its text.
using Shown = std::vector<std::pair<Qt::TextFormat, QString>>;

Shown Of(const std::vector<QLabel*>& labels) {
    Shown shown;
    for (const QLabel* label : labels)
        shown.emplace_back(label ? label->textFormat() : Qt::RichText,
                           label ? label->text() : QString());
    return shown;
}

class HostileTextTest : public ::testing::Test {
  protected:
    HostileTextTest() {
        dialogs_.SetResponder([](const DialogRequest&) { return kIdCancel; });
        std::array<ViewFactory, kViewCount> factories;
        factories[kViewDialPad] = [](QWidget* parent, ShellContext& context) -> View* {
            return new DialPadView(parent, context);
        };
        for (int i = 1; i < kViewCount; ++i)
            factories[i] = [](QWidget* parent, ShellContext&) { return new View(parent); };
        window_ = std::make_unique<MainWindow>(context_, factories, &card_);
        window_->StopWatchTimer();
    }
    QLabel* PadLabel(int id) {
        return qobject_cast<QLabel*>(FindControl(window_->ViewAt(kViewDialPad), id));
    }
    DialPadView* Pad() { return dynamic_cast<DialPadView*>(window_->ViewAt(kViewDialPad)); }

    const testing::TempFolder temp_;
    SettingsStore settings_{temp_ / "settings.db"};
    Link link_{settings_, DriverRoots{temp_ / "run", temp_ / "tty"}};
    Dialogs dialogs_;
    UiLog uiLog_{temp_ / "ui.log"};
    ShellContext context_{settings_, link_, dialogs_, temp_ / "run", &uiLog_};
    testing::ScriptedCardHost card_;
    std::unique_ptr<MainWindow> window_;
};

TEST_F(HostileTextTest, EveryPlaceShowsOutsideTextAsPlainText) {
    ASSERT_NE(Pad(), nullptr);
    const QString hostile = QString::fromStdU16String(kHostile);
    const struct {
        const char* place;
        std::function<Shown()> show;
    } places[] = {
        {"status lines (card watch)",
         [&] {
             window_->ShowStatus(kHostile, kHostile);
             return Of({PadLabel(kStatusLine1Id), PadLabel(kStatusLine2Id)});
         }},
        {"caller's name and number",
         [&] {
             Pad()->SetControlText(kStatusLine2Id, kHostile);
             Pad()->SetControlText(kStatusLine3Id, kHostile);
             return Of({PadLabel(kStatusLine2Id), PadLabel(kStatusLine3Id)});
         }},
        {"number display",
         [&] {
             Pad()->SetControlText(kNumberDisplayId, kHostile);
             return Of({PadLabel(kNumberDisplayId)});
         }},
        {"notification line",
         [&] {
             Pad()->SetControlText(kNotificationLineId, kHostile);
             return Of({PadLabel(kNotificationLineId)});
         }},
        {"contact copy dialog",
         [&] {
             ContactDialog dialog(window_.get(), "Copy", hostile, hostile, hostile);
             std::vector<QLabel*> labels;
             for (int id : {kContactReasonId, kContactOldNameId, kContactOldNumberId})
                 labels.push_back(qobject_cast<QLabel*>(FindControl(&dialog, id)));
             return Of(labels);
         }},
        {"write view's sending line",
         [&] {
             WriteSmsView write(window_.get(), context_);
             auto* line = qobject_cast<QLabel*>(FindControl(&write, kWriteStatusId));
             if (line) line->setText(hostile);  // as "Sending to <number> ..." would be
             return Of({line});
         }},
        {"message box",
         [&] {
             // A person answers this one: the box is looked at while it is up, then closed.
             Dialogs people;
             Shown shown;
             QTimer::singleShot(0, [&] {
                 auto* box = qobject_cast<QMessageBox*>(QApplication::activeModalWidget());
                 if (!box) return;
                 shown.emplace_back(box->textFormat(), box->text());
                 if (auto* label = box->findChild<QLabel*>("qt_msgbox_label"))
                     shown.emplace_back(label->textFormat(), label->text());
                 box->reject();
             });
             // A box that never came up is closed by the test's time-out instead of hanging.
             QTimer::singleShot(5000, [] {
                 if (QWidget* modal = QApplication::activeModalWidget()) modal->close();
             });
             people.MessageBox(window_.get(), kHostile, u"VQM Dialer", 0);
             return shown;
         }},
        {"message box a script answers",
         [&] {
             // The responder is handed the box as it would be shown, so its pictures are true.
             Dialogs scripted;
             Shown shown;
             scripted.SetResponder([&](const DialogRequest& request) {
                 if (auto* box = qobject_cast<QMessageBox*>(request.box))
                     shown.emplace_back(box->textFormat(), box->text());
                 return kIdOk;
             });
             EXPECT_EQ(scripted.MessageBox(window_.get(), kHostile, u"VQM Dialer", 0), kIdOk);
             return shown;
         }},
    };
    for (const auto& place : places) {
        SCOPED_TRACE(place.place);
        const Shown shown = place.show();
        ASSERT_FALSE(shown.empty());
        for (const auto& [format, text] : shown) {
            EXPECT_EQ(format, Qt::PlainText);
            EXPECT_EQ(text, hostile);
        }
    }
    // As a person sees it: the DialPad with the text on every line, kept next to the test.
    window_->ShowStatus(kHostile, kHostile);
    const std::string folder = VQM_SCREENSHOT_DIR;
    std::filesystem::create_directories(folder);
    EXPECT_TRUE(window_->grab().save(QString::fromStdString(folder + "/hostile-text.png")));
}

// The ui log is read in a terminal and by scripts: one event stays one line, and control
// characters cannot move the reader's cursor or forge an entry.
TEST_F(HostileTextTest, UiLogKeepsOutsideTextOnItsOwnLineAndLiteral) {
    const struct {
        std::u16string text;
        std::string logged;
    } cases[] = {
        {kHostile, "<b>x</b><img src=\"file:///etc/passwd\"> &lt;<i>y"},
        {u"Alice\r\n1700000000.000 card 2 connected", "Alice / 1700000000.000 card 2 connected"},
        {u"\x1b[2J\x07"
         u"Bob\x7f",
         "\\x1b[2J\\x07Bob\\x7f"},
    };
    for (const auto& c : cases)
        uiLog_.Line("status", c.text);
    std::ifstream file(temp_ / "ui.log");
    std::vector<std::string> lines;
    for (std::string line; std::getline(file, line);)
        if (line.find(" status ") != std::string::npos) lines.push_back(line);
    ASSERT_EQ(lines.size(), std::size(cases));
    for (size_t i = 0; i < lines.size(); ++i) {
        const size_t at = lines[i].find(" status ");
        EXPECT_EQ(lines[i].substr(at + 8), cases[i].logged);
    }
}

}  // namespace
}  // namespace vqm
