// The Call Log view offscreen: lists filled from hand-written log files with names from the
// caches, the order after a load and after header taps, the menu's greying and commands,
// appends from the call code, refreshes, and a screenshot of each page.
#include "calls/call_log_view.h"

#include <gtest/gtest.h>

#include <QAction>
#include <QApplication>
#include <QHeaderView>
#include <QMenu>
#include <QScrollBar>
#include <QStyle>
#include <QTabBar>
#include <QTreeWidget>
#include <cstring>
#include <filesystem>
#include <fstream>
#include <thread>

#include "link/link.h"
#include "shell/dialogs.h"
#include "shell/messages.h"
#include "support/settings_store.h"
#include "tests/common/temp_folder.h"

namespace vqm {
namespace {

namespace fs = std::filesystem;

CallLogRecord Record(const char* number, const char* time, int32_t sequence) {
    CallLogRecord record{};
    std::strncpy(record.number, number, sizeof record.number - 1);
    std::strncpy(record.time, time, sizeof record.time - 1);
    record.sequence = sequence;
    return record;
}

class CallLogViewTest : public ::testing::Test {
  protected:
    CallLogViewTest() {
        const std::u16string folder(temp_.Path().begin(), temp_.Path().end());
        SetSettingString(settings_, u"InstallPath", folder.c_str());
        log_.localTime = [this] {
            std::tm t{};
            t.tm_year = 2024 - 1900;
            t.tm_mon = 6;
            t.tm_mday = 1;
            t.tm_hour = 12;
            t.tm_min = ticks_ / 60;
            t.tm_sec = ticks_ % 60;
            ++ticks_;
            return t;
        };
        PhonebookEntry alice{};
        alice.index = 1;
        alice.type = 145;
        std::strcpy(alice.number, "+447700900123");
        std::strcpy(alice.text, "Alice");
        alice.numberLength = 13;
        alice.textLength = 5;
        Write("simphonebk1.db", &alice, sizeof alice);
        OutlookMobileRecord harry{};
        std::strcpy(harry.name, "Home Harry");
        std::strcpy(harry.number, "01632960001");
        Write("phonebk1.db", &harry, sizeof harry);

        WriteLog(1, {Record("+447700900123", "09:15:00,02/01/2024", 1),
                     Record("", "23:59:59,31/12/2023", 2),
                     Record("01632960001", "08:00:00,15/06/2024", 3),
                     Record("07700900555", "10:00:00,02/01/2024", 4)});
        host_.resize(240, 320 - kMenuBarHeight);
    }

    void Write(const std::string& name, const void* data, size_t size) const {
        std::ofstream(temp_ / name, std::ios::binary)
            .write(static_cast<const char*>(data), static_cast<std::streamsize>(size));
    }
    void WriteLog(int log, const std::vector<CallLogRecord>& records) const {
        Write("callog" + std::to_string(log) + ".db", records.data(),
              records.size() * sizeof(CallLogRecord));
    }

    CallLogView& Make() {
        view_ = new CallLogView(&host_, context_, &log_, &caches_,
                                [this](const std::u16string& number) {
                                    dialled_.push_back(number);
                                    return 1;
                                });
        view_->SetCardStateSource([this] { return cardState_; });
        host_.show();
        return *view_;
    }

    std::vector<std::string> Column(int log, int column) const {
        std::vector<std::string> out;
        QTreeWidget* list = view_->List(log);
        for (int i = 0; i < list->topLevelItemCount(); ++i)
            out.push_back(list->topLevelItem(i)->text(column).toStdString());
        return out;
    }
    QPoint RowPoint(int log, int row) const {
        QTreeWidget* list = view_->List(log);
        return list->visualItemRect(list->topLevelItem(row)).center();
    }
    void TapTab(int index) const {
        qobject_cast<QTabBar*>(FindControl(view_, kCallLogTabId))->setCurrentIndex(index);
    }
    static QAction* Action(QMenu* menu, const char* text) {
        for (QAction* action : menu->actions())
            if (action->text() == text) return action;
        return nullptr;
    }

    const testing::TempFolder temp_;
    SettingsStore settings_{temp_ / "settings.db"};
    Link link_{settings_, DriverRoots{temp_ / "run", temp_ / "tty"}};
    Dialogs dialogs_;
    ShellContext context_{settings_, link_, dialogs_, temp_ / "run"};
    CallLog log_{settings_};
    PhonebookCaches caches_{settings_};
    QWidget host_;
    CallLogView* view_ = nullptr;
    int cardState_ = 2;
    int ticks_ = 0;
    std::vector<std::u16string> dialled_;
};

TEST_F(CallLogViewTest, PagesListsAndColumnsAreBuiltAndTheLimitsWrittenBack) {
    CallLogView& view = Make();
    ASSERT_EQ(view.Pages().Count(), 3);
    const char* classes[] = {"CALLLOG_INCOMING_PAGE", "CALLLOG_OUTGOING_PAGE",
                             "CALLLOG_MISSED_PAGE"};
    auto* tabs = qobject_cast<QTabBar*>(FindControl(&view, kCallLogTabId));
    ASSERT_NE(tabs, nullptr);
    const char* titles[] = {"Answered", "Dialed", "Unanswered"};
    for (int log = 1; log <= 3; ++log) {
        EXPECT_EQ(view.Pages().records[log - 1].window->objectName().toStdString(),
                  classes[log - 1]);
        EXPECT_EQ(tabs->tabText(log - 1).toStdString(), titles[log - 1]);
        QTreeWidget* list = view.List(log);
        EXPECT_EQ(FindControl(&view, kCallLogListFirstId + log - 1), list);
        EXPECT_EQ(list->headerItem()->text(0), "Call");
        EXPECT_EQ(list->headerItem()->text(1), "Date & Time");
        EXPECT_TRUE(list->isColumnHidden(kColumnNumber));
        EXPECT_TRUE(list->isColumnHidden(kColumnSequence));
        // The list fills its page, which sits between the label and the tab strip.
        EXPECT_EQ(list->geometry(), view.Pages().records[log - 1].window->rect());
    }
    EXPECT_LE(view.Pages().records[0].window->geometry().bottom(), tabs->geometry().top());
    int32_t limit = 0;
    EXPECT_EQ(GetSettingInt(settings_, u"CallLogSize3", &limit), 1);
    EXPECT_EQ(limit, 20);
}

TEST_F(CallLogViewTest, ALoadShowsNamesAndPutsTheNewestCallFirst) {
    Make();
    EXPECT_EQ(Column(1, kColumnDateTime),
              (std::vector<std::string>{"08:00:00,15/06/2024", "10:00:00,02/01/2024",
                                        "09:15:00,02/01/2024", "23:59:59,31/12/2023"}));
    EXPECT_EQ(Column(1, kColumnCall),
              (std::vector<std::string>{"Home Harry", "07700900555", "Alice", "No number"}));
    EXPECT_EQ(Column(1, kColumnNumber),
              (std::vector<std::string>{"01632960001", "07700900555", "+447700900123", ""}));
    EXPECT_EQ(Column(1, kColumnSequence), (std::vector<std::string>{"3", "4", "1", "2"}));
    EXPECT_EQ(view_->List(2)->topLevelItemCount(), 0);
}

TEST_F(CallLogViewTest, HeaderTapsToggleTheOrderAndHiddenColumnsDoNothing) {
    Make();
    QHeaderView* header = view_->List(1)->header();
    const auto newest = Column(1, kColumnDateTime);
    auto oldest = newest;
    std::reverse(oldest.begin(), oldest.end());

    emit header->sectionClicked(kColumnDateTime);
    EXPECT_EQ(Column(1, kColumnDateTime), oldest);
    emit header->sectionClicked(kColumnDateTime);
    EXPECT_EQ(Column(1, kColumnDateTime), newest);

    emit header->sectionClicked(kColumnCall);
    EXPECT_EQ(Column(1, kColumnCall),
              (std::vector<std::string>{"No number", "Home Harry", "Alice", "07700900555"}));
    const int flag = view_->SortFlag(1);
    emit header->sectionClicked(kColumnNumber);
    emit header->sectionClicked(kColumnSequence);
    EXPECT_EQ(view_->SortFlag(1), flag);
    EXPECT_EQ(Column(1, kColumnCall).front(), "No number");
    emit header->sectionClicked(kColumnCall);
    EXPECT_EQ(Column(1, kColumnCall),
              (std::vector<std::string>{"07700900555", "Alice", "Home Harry", "No number"}));
}

TEST_F(CallLogViewTest, TheMenuGreysWhatNeedsAnEntryOrTheCard) {
    Make();
    QTreeWidget* list = view_->List(1);
    const QPoint empty(10, list->viewport()->height() - 3);
    ASSERT_EQ(list->itemAt(empty), nullptr);

    QMenu* menu = view_->PrepareMenu(1, empty);
    EXPECT_FALSE(Action(menu, "Make Call")->isEnabled());
    EXPECT_FALSE(Action(menu, "Delete")->isEnabled());
    EXPECT_TRUE(Action(menu, "Clear This Log")->isEnabled());
    EXPECT_TRUE(Action(menu, "Clear All Logs")->isEnabled());
    // The commands that come later are not offered yet.
    EXPECT_EQ(Action(menu, "Write Message"), nullptr);
    EXPECT_EQ(Action(menu, "Copy To SIM Card"), nullptr);

    menu = view_->PrepareMenu(1, RowPoint(1, 2));
    EXPECT_EQ(list->selectedItems(), QList<QTreeWidgetItem*>{list->topLevelItem(2)});
    EXPECT_EQ(list->currentItem(), list->topLevelItem(2));
    EXPECT_TRUE(Action(menu, "Make Call")->isEnabled());
    EXPECT_TRUE(Action(menu, "Delete")->isEnabled());

    cardState_ = 1;
    menu = view_->PrepareMenu(1, RowPoint(1, 0));
    EXPECT_EQ(list->selectedItems(), QList<QTreeWidgetItem*>{list->topLevelItem(0)});
    EXPECT_FALSE(Action(menu, "Make Call")->isEnabled());
    EXPECT_TRUE(Action(menu, "Delete")->isEnabled());

    // Two selected: a tap elsewhere keeps both.
    list->topLevelItem(1)->setSelected(true);
    view_->PrepareMenu(1, RowPoint(1, 3));
    EXPECT_EQ(list->selectedItems().size(), 2);
    EXPECT_FALSE(list->topLevelItem(3)->isSelected());
}

TEST_F(CallLogViewTest, MakeCallDialsTheStoredNumberAndNothingWithoutOne) {
    Make();
    // Row 2 shows "Alice"; the call goes to her number.
    QMenu* menu = view_->PrepareMenu(1, RowPoint(1, 2));
    Action(menu, "Make Call")->trigger();
    EXPECT_EQ(dialled_, std::vector<std::u16string>{u"+447700900123"});
    menu = view_->PrepareMenu(1, RowPoint(1, 3));  // "No number"
    Action(menu, "Make Call")->trigger();
    EXPECT_EQ(dialled_.size(), 1u);
}

TEST_F(CallLogViewTest, DeleteRemovesTheSelectedEntriesAndReloads) {
    Make();
    QTreeWidget* list = view_->List(1);
    // Rows 1 and 3: sequence numbers 4 and 2.
    view_->PrepareMenu(1, RowPoint(1, 1));
    list->topLevelItem(3)->setSelected(true);
    QMenu* menu = view_->PrepareMenu(1, RowPoint(1, 3));
    Action(menu, "Delete")->trigger();

    std::vector<int32_t> left;
    for (const CallLogRecord& r : ReadCallLog(log_, 1))
        left.push_back(r.sequence);
    EXPECT_EQ(left, (std::vector<int32_t>{1, 3}));
    EXPECT_EQ(Column(1, kColumnCall), (std::vector<std::string>{"Home Harry", "Alice"}));
}

TEST_F(CallLogViewTest, ClearThisLogTakesTheShownPageAndClearAllTakesEvery) {
    WriteLog(2, {Record("111", "01:00:00,01/01/2024", 1)});
    WriteLog(3, {Record("222", "01:00:00,01/01/2024", 1)});
    Make();
    TapTab(1);
    ASSERT_EQ(view_->CurrentLog(), 2);
    Action(view_->PrepareMenu(2, QPoint(5, 5)), "Clear This Log")->trigger();
    EXPECT_FALSE(fs::exists(temp_ / "callog2.db"));
    EXPECT_EQ(view_->List(2)->topLevelItemCount(), 0);
    EXPECT_EQ(view_->List(1)->topLevelItemCount(), 4);
    EXPECT_TRUE(fs::exists(temp_ / "callog3.db"));

    Action(view_->PrepareMenu(2, QPoint(5, 5)), "Clear All Logs")->trigger();
    for (int log = 1; log <= 3; ++log) {
        EXPECT_FALSE(fs::exists(temp_ / ("callog" + std::to_string(log) + ".db")));
        EXPECT_EQ(view_->List(log)->topLevelItemCount(), 0);
    }
}

TEST_F(CallLogViewTest, AppendsShowAtTheTopAndAFullLogIsReloaded) {
    Make();
    for (int i = 1; i <= 20; ++i)
        AddDialedCall(log_, ("0700" + std::to_string(i)).c_str());
    EXPECT_EQ(view_->List(2)->topLevelItemCount(), 20);
    EXPECT_EQ(Column(2, kColumnCall).front(), "070020");
    AddDialedCall(log_, "+447700900123");
    EXPECT_EQ(view_->List(2)->topLevelItemCount(), 20);
    EXPECT_EQ(Column(2, kColumnCall).front(), "Alice");
    EXPECT_EQ(Column(2, kColumnCall).back(), "07002");

    // From another thread, as the dial thread does: the list follows once the events run.
    std::thread caller([this] { AddUnansweredCall(log_, "No number"); });
    caller.join();
    for (int i = 0; i < 100 && view_->List(3)->topLevelItemCount() == 0; ++i)
        QApplication::processEvents();
    EXPECT_EQ(Column(3, kColumnCall), std::vector<std::string>{"No number"});
}

TEST_F(CallLogViewTest, RefreshesReloadTheFilesAndLookNamesUpAgain) {
    Make();
    WriteLog(2, {Record("01632960002", "01:00:00,01/01/2024", 1)});
    EXPECT_EQ(view_->List(2)->topLevelItemCount(), 0);
    view_->OnMessage(kMsgRefreshLists, 0, 0);
    EXPECT_EQ(Column(2, kColumnCall), std::vector<std::string>{"01632960002"});

    OutlookMobileRecord newContact{};
    std::strcpy(newContact.name, "New Nina");
    std::strcpy(newContact.number, "01632960002");
    Write("phonebk1.db", &newContact, sizeof newContact);
    view_->OnMessage(kMsgOutlookCacheBuilt, 0, 0);
    EXPECT_EQ(Column(2, kColumnCall), std::vector<std::string>{"New Nina"});

    fs::remove(temp_ / "callog1.db");
    view_->OnMessage(kMsgViewShown, 0, 0);
    EXPECT_EQ(view_->List(1)->topLevelItemCount(), 0);
}

TEST_F(CallLogViewTest, AnInternationalNumberAndItsDateFitAndALongerNumberLosesItsMiddle) {
    const QString international = "+447700900123456";  // 15 digits
    const QString longer = "+44770090012345678901234";
    WriteLog(2, {Record("+447700900123456", "18:42:10,03/07/2024", 1),
                 Record("+44770090012345678901234", "07:05:59,04/07/2024", 2)});
    Make();
    TapTab(1);
    QApplication::processEvents();
    QTreeWidget* list = view_->List(2);
    EXPECT_FALSE(list->horizontalScrollBar()->isVisible());
    EXPECT_EQ(list->textElideMode(), Qt::ElideMiddle);
    const QFontMetrics metrics(list->font());
    const int margins = 2 * (list->style()->pixelMetric(QStyle::PM_FocusFrameHMargin) + 1);
    auto room = [&](int row, int column) {
        return list->visualRect(list->model()->index(row, column)).width() - margins;
    };
    ASSERT_EQ(list->topLevelItemCount(), 2);
    for (int row = 0; row < 2; ++row) {
        const QTreeWidgetItem* item = list->topLevelItem(row);
        // Both columns lie inside the list's visible width.
        EXPECT_LE(list->visualRect(list->model()->index(row, kColumnDateTime)).right(),
                  list->viewport()->width());
        EXPECT_LE(metrics.horizontalAdvance(item->text(kColumnDateTime)), room(row, 1));
        const QString number = item->text(kColumnCall);
        if (number == international) {
            EXPECT_LE(metrics.horizontalAdvance(number), room(row, 0));
        } else {
            ASSERT_EQ(number, longer);
            const QString shown = metrics.elidedText(number, Qt::ElideMiddle, room(row, 0));
            EXPECT_NE(shown, number);
            EXPECT_TRUE(shown.startsWith("+4477")) << shown.toStdString();
            EXPECT_TRUE(shown.endsWith("234")) << shown.toStdString();
        }
    }
    const std::string folder = VQM_SCREENSHOT_DIR;
    fs::create_directories(folder);
    EXPECT_TRUE(view_->grab().save(QString::fromStdString(folder + "/calllog-international.png")));
}

TEST_F(CallLogViewTest, ScreenshotOfEachPage) {
    WriteLog(2, {Record("+447700900123", "18:42:10,03/07/2024", 1),
                 Record("0800123456", "07:05:59,04/07/2024", 2)});
    WriteLog(3, {Record("01632960001", "22:30:00,01/07/2024", 1)});
    Make();
    const std::string folder = VQM_SCREENSHOT_DIR;
    fs::create_directories(folder);
    const char* names[] = {"calllog-answered.png", "calllog-dialed.png", "calllog-unanswered.png"};
    for (int page = 0; page < 3; ++page) {
        TapTab(page);
        // The columns shown fit the width: no sideways scrolling.
        EXPECT_FALSE(view_->List(page + 1)->horizontalScrollBar()->isVisible());
        view_->List(page + 1)->topLevelItem(0)->setSelected(true);
        QApplication::processEvents();
        EXPECT_TRUE(view_->grab().save(QString::fromStdString(folder + "/" + names[page])));
    }
}

}  // namespace
}  // namespace vqm
