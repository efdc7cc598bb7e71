// The Call Log view (CALLLOG_VIEW, view 5): three pages, "Answered", "Dialed" and
// "Unanswered", each a report list of its log file with names from the phonebook caches. The
// files and their rules are calls/call_log.h's; this file lists, sorts and offers the menu.
#pragma once

#include <QPoint>
#include <array>
#include <functional>
#include <memory>
#include <string>

#include "calls/call_log.h"
#include "contacts/phonebook_cache.h"
#include "shell/main_window.h"
#include "shell/views.h"

class QAction;
class QLabel;
class QMenu;
class QTreeWidget;
class QTreeWidgetItem;

namespace vqm {

inline constexpr int kCallLogTabId = 1122;
// The lists of logs 1, 2 and 3.
inline constexpr int kCallLogListFirstId = 1123;
inline constexpr int kCallLogLabelHeight = 16;

// Columns of every list: what is shown, when, and two hidden ones the commands work from.
inline constexpr int kColumnCall = 0, kColumnDateTime = 1, kColumnNumber = 2, kColumnSequence = 3;

class CallLogView : public View {
  public:
    // Places a call; the DialPad's Dial in the program.
    using DialFunction = std::function<int(const std::u16string& number)>;

    // callLog and caches are the program's shared ones when given; otherwise the view keeps
    // its own over the same files.
    CallLogView(QWidget* parent, ShellContext& context, CallLog* callLog = nullptr,
                PhonebookCaches* caches = nullptr, DialFunction dial = {});
    ~CallLogView() override;

    long OnMessage(unsigned msg, long wParam, long lParam) override;

    // Fills log n's list from its file, newest first.
    void LoadCallLog(int log);
    // Looks the numbers of all three lists up again and shows the names found.
    void RefreshCallLogNames();

    QTreeWidget* List(int log) const;
    ViewSet& Pages() { return pages_; }
    CallLog& Log() { return *callLog_; }
    // The log of the page shown.
    int CurrentLog() const { return pages_.current + 1; }
    int SortFlag(int log) const { return sortFlag_[log - 1]; }

    // The tap-and-hold menu of a list, made ready for a tap at pos (list viewport
    // coordinates): the tapped item selected, commands greyed. Shown by the gesture; tests
    // look at it and trigger its actions.
    QMenu* PrepareMenu(int log, QPoint pos);
    // Where the card state comes from; the main window's by default.
    void SetCardStateSource(std::function<int()> source) { cardState_ = std::move(source); }
    void SetDial(DialFunction dial) { dial_ = std::move(dial); }

  protected:
    void resizeEvent(QResizeEvent* event) override;

  private:
    struct Menu {
        QMenu* menu = nullptr;
        QAction* makeCall = nullptr;
        QAction* remove = nullptr;
        QAction* clearThis = nullptr;
        QAction* clearAll = nullptr;
    };

    QTreeWidget* MakeList(QWidget* page, int log);
    void AddItem(int log, const CallLogRecord& record);
    // Sorts log n's list by a column with its sort flag; the header taps and the loads use it.
    void SortList(int log, int column);
    void OnHeaderTap(int log, int column);
    void OnLogChanged(int log, CallLogChange change, const CallLogRecord* record);
    void MakeCall(int log);
    void DeleteSelected(int log);
    void Relayout();

    ShellContext& context_;
    std::unique_ptr<CallLog> ownCallLog_;
    std::unique_ptr<PhonebookCaches> ownCaches_;
    CallLog* callLog_;
    PhonebookCaches* caches_;
    DialFunction dial_;
    std::function<int()> cardState_;
    QLabel* label_ = nullptr;
    ViewSet pages_;
    std::array<QTreeWidget*, kCallLogCount> lists_{};
    std::array<int, kCallLogCount> sortFlag_{1, 1, 1};
    std::array<Menu, kCallLogCount> menus_{};
};

}  // namespace vqm
