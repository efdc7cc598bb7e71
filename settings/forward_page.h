// The "Call Forward" page of the Settings view: Voice, Data and Fax sub-pages under tab strip
// 1067, each with the four forwarding reasons, and "Deactivate All Call Forward" (1078) below
// them. Also the card-job runner that the settings pages share.
#pragma once

#include <QDialog>
#include <array>
#include <functional>
#include <memory>
#include <string>

#include "calls/card_worker.h"
#include "shell/main_window.h"
#include "shell/views.h"

class QComboBox;
class QLineEdit;
class QPushButton;
class QRadioButton;

namespace vqm {

// Runs the settings pages' exchanges with the card on a worker thread, one after the other,
// under the wait cursor, and hands each result back on the page's thread. A card pulled while
// an exchange waits ends it with -1 (the link closes), so the cursor always goes.
class CardJobs {
  public:
    CardJobs(QObject* owner, ShellContext& context);
    ~CardJobs();
    CardJobs(const CardJobs&) = delete;
    CardJobs& operator=(const CardJobs&) = delete;

    void Run(std::function<int(Link&)> exchange, std::function<void(int result)> done);
    // Jobs handed in whose results have not been delivered yet.
    int Pending() const { return pending_; }

  private:
    void Busy(bool busy);

    QObject* owner_;
    ShellContext& context_;
    int pending_ = 0;
    CardWorker worker_;
};

// A wrapper's result that the pages count as failed: no answer (-1) or ERROR (4, which is
// also what a "+CME ERROR" reads as). Anything else, BUSY included, counts as done.
inline bool CardFailed(int result) {
    return result == -1 || result == 4;
}

// A WM_COMMAND to a settings page (over the dialer's socket, or a menu): the control with
// that id is tapped, looked for in the sub-page shown first, then in the page. 1 when found.
long TapControl(QWidget* subPage, QWidget* page, int id);
// The Voice, Data and Fax sub-pages of a network-service page under its tab strip (tabId),
// each filled by build before the strip places it, and the page's one button for every class
// in a row of the given height below them; the button's click runs onClick.
void CreateClassPages(View* page, ViewSet& pages, int tabId, const char* const pageClasses[3],
                      const std::function<void(View*, int)>& build, const char* buttonText,
                      int buttonId, int buttonHeight, const std::function<void()>& onClick);
// One line of what a page shows, for the dialer's --ui-log record: "<kind> <text>".
void LogShown(ShellContext& context, const char* kind, const QString& text);

inline constexpr int kForwardTabId = 1067;
inline constexpr int kForwardStateFirstId = 1068;   // + reason: the row's state
inline constexpr int kForwardButtonFirstId = 1072;  // + reason: the row's button
inline constexpr int kForwardRequestId = 1076, kForwardDeactivateClassId = 1077,
                     kForwardDeactivateAllId = 1078;
// Dialog 138.
inline constexpr int kForwardActivateRadioId = 1153, kForwardDeactivateRadioId = 1154,
                     kForwardNumberEditId = 1149, kForwardTimeListId = 1157;

// "Forward Request": activate to a number or deactivate one class and reason.
class ForwardDialog : public QDialog {
  public:
    ForwardDialog(QWidget* parent, ShellContext& context, int serviceClass, int reason,
                  const QString& rowText);
    QRadioButton* Activate() const { return activate_; }
    QRadioButton* Deactivate() const { return deactivate_; }
    QLineEdit* Number() const { return number_; }
    QComboBox* TimeList() const { return time_; }
    // The no-reply time to send: the list's choice for "Unanswered:", 20 s for every other reason.
    int Seconds() const;
    // Why "Send Request" cannot go to the card: "Activate To:" with an edit that does not hold a
    // phone number ("Unknown", nothing, letters). Empty when it can.
    std::u16string NumberProblem() const;
    // "Send Request" with a number problem shows it and keeps the dialog open.
    void done(int result) override;

  private:
    void ChooseActivate();
    void ChooseDeactivate();

    ShellContext& context_;
    int serviceClass_, reason_;
    QRadioButton* activate_;
    QRadioButton* deactivate_;
    QLineEdit* number_;
    QComboBox* time_;
};

class ForwardPage : public View {
  public:
    static constexpr int kClasses = 3;

    ForwardPage(QWidget* parent, ShellContext& context);
    ~ForwardPage() override;
    long OnMessage(unsigned msg, long wParam, long lParam) override;

    // The sub-page of class index 0 voice, 1 data, 2 fax, and its class value (1, 2, 4).
    View* SubPage(int index) const { return pages_.records[index].window; }
    static int ClassOf(int index) { return 1 << index; }
    QLineEdit* State(int index, int reason) const;
    QPushButton* RowButton(int index, int reason) const;
    const CardJobs& Jobs() const { return jobs_; }

    void Request(int index);
    void OpenRow(int index, int reason);
    void DeactivateClass(int index);
    void DeactivateAll();

  private:
    void BuildSubPage(View* page, int index);
    void EnableConditionalRows(int index, bool enable);

    ShellContext& context_;
    ViewSet pages_;
    CardJobs jobs_;
};

}  // namespace vqm
