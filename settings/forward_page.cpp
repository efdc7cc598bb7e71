#include "settings/forward_page.h"

#include <QAbstractButton>
#include <QApplication>
#include <QComboBox>
#include <QDialogButtonBox>
#include <QEvent>
#include <QGridLayout>
#include <QLabel>
#include <QLineEdit>
#include <QMetaObject>
#include <QPushButton>
#include <QRadioButton>
#include <QVBoxLayout>
#include <cstdio>

#include "settings/forwarding_at.h"
#include "shell/card_watch.h"
#include "shell/dialogs.h"
#include "shell/messages.h"
#include "shell/ui_log.h"
#include "support/gsm.h"
#include "support/settings_store.h"

namespace vqm {

namespace {

constexpr char16_t kNotActive[] = u"NOT ACTIVE";
constexpr char16_t kUnknown[] = u"Unknown";
constexpr const char* kRowLabels[4] = {"All Calls:", "If Busy:", "Unanswered:", "Not Reachable:"};
constexpr const char* kClassNames[ForwardPage::kClasses] = {"Voice", "Data", "Fax"};
constexpr const char* kPageClasses[ForwardPage::kClasses] = {"SETTINGS_CALLFORWARD_VOICE_PAGE",
                                                             "SETTINGS_CALLFORWARD_DATA_PAGE",
                                                             "SETTINGS_CALLFORWARD_FAX_PAGE"};
constexpr int kRowHeight = 20, kRowStep = 26, kMargin = 5, kLabelWidth = 100;

QString Q(const std::u16string& text) {
    return QString::fromStdU16String(text);
}

// "CallForward<class><reason>": the last number forwarded to for the pair.
std::u16string StoredNumberName(int serviceClass, int reason) {
    char narrow[32];
    std::snprintf(narrow, sizeof narrow, "CallForward%d%d", serviceClass, reason);
    return std::u16string(narrow, narrow + std::char_traits<char>::length(narrow));
}

}  // namespace

long TapControl(QWidget* subPage, QWidget* page, int id) {
    QWidget* control = subPage ? FindControl(subPage, id) : nullptr;
    if (!control) control = FindControl(page, id);
    auto* button = qobject_cast<QAbstractButton*>(control);
    if (!button || !button->isEnabled()) return 0;
    button->click();
    return 1;
}

namespace {

// Runs its action whenever the watched widget changes size.
class ResizeFollower : public QObject {
  public:
    ResizeFollower(QObject* parent, std::function<void()> action)
        : QObject(parent), action_(std::move(action)) {}
    bool eventFilter(QObject*, QEvent* event) override {
        if (event->type() == QEvent::Resize) action_();
        return false;
    }

  private:
    std::function<void()> action_;
};

}  // namespace

void CreateClassPages(View* page, ViewSet& pages, int tabId, const char* const pageClasses[3],
                      const std::function<void(View*, int)>& build, const char* buttonText,
                      int buttonId, int buttonHeight, const std::function<void()>& onClick) {
    static constexpr const char* kTitles[3] = {"Voice", "Data", "Fax"};
    for (int i = 0; i < 3; ++i) {
        ViewRecord record;
        record.caption = QString(kTitles[i]).toStdU16String();
        record.className = pageClasses[i];
        record.windowProc = [build, i](QWidget* pageParent) -> View* {
            auto* subPage = new View(pageParent);
            build(subPage, i);
            return subPage;
        };
        pages.records.push_back(std::move(record));
    }
    // The tabs take the page but for the button row below them.
    auto rectAbove = [page, buttonHeight] {
        return QRect(0, 0, page->width(), page->height() - 2 * kMargin - buttonHeight);
    };
    CreateTabbedPages(page, tabId, pages, rectAbove());
    auto* all = new QPushButton(buttonText, page);
    SetControlId(all, buttonId);
    QObject::connect(all, &QPushButton::clicked, page, onClick);
    // The page is built at its parent's size and only then placed above the Settings view's
    // own tab strip: the button row follows the page's bottom whenever its size changes.
    auto place = [page, &pages, tabId, all, buttonHeight, rectAbove] {
        QRect rect = rectAbove();
        rect.setHeight(rect.height() - kMenuBarHeight);
        if (QWidget* tabs = FindControl(page, tabId))
            tabs->setGeometry(rect.left(), rect.bottom() + 1, rect.width(), kMenuBarHeight);
        for (ViewRecord& record : pages.records) {
            record.rect = rect;
            if (record.window) record.window->setGeometry(rect);
        }
        all->setGeometry(kMargin, page->height() - kMargin - buttonHeight,
                         page->width() - 2 * kMargin, buttonHeight);
    };
    place();
    page->installEventFilter(new ResizeFollower(page, place));
}

void LogShown(ShellContext& context, const char* kind, const QString& text) {
    if (context.uiLog) context.uiLog->Line(kind, text.toStdU16String());
}

// CardJobs

CardJobs::CardJobs(QObject* owner, ShellContext& context) : owner_(owner), context_(context) {}

CardJobs::~CardJobs() {
    worker_.Stop();
    worker_.Join();
    // Results that will not be delivered any more must not keep the window busy.
    while (pending_ > 0) {
        --pending_;
        Busy(false);
    }
}

void CardJobs::Busy(bool busy) {
    if (context_.mainWindow) {
        BusyIndicator& indicator = context_.mainWindow->Busy();
        busy ? indicator.BeginBusy() : indicator.EndBusy();
    } else if (busy) {
        QApplication::setOverrideCursor(Qt::WaitCursor);
    } else {
        QApplication::restoreOverrideCursor();
    }
}

void CardJobs::Run(std::function<int(Link&)> exchange, std::function<void(int)> done) {
    ++pending_;
    Busy(true);
    worker_.Post([this, exchange = std::move(exchange), done = std::move(done)] {
        const int result = exchange(context_.link);
        QMetaObject::invokeMethod(
            owner_,
            [this, done, result] {
                --pending_;
                Busy(false);
                if (done) done(result);
            },
            Qt::QueuedConnection);
    });
}

// ForwardDialog

ForwardDialog::ForwardDialog(QWidget* parent, ShellContext& context, int serviceClass, int reason,
                             const QString& rowText)
    : QDialog(parent), context_(context), serviceClass_(serviceClass), reason_(reason) {
    setObjectName("FORWARD_REQUEST_DIALOG");
    setWindowTitle("Forward Request");
    auto* layout = new QVBoxLayout(this);
    activate_ = new QRadioButton("Activate To:", this);
    SetControlId(activate_, kForwardActivateRadioId);
    number_ = new QLineEdit(rowText, this);
    SetControlId(number_, kForwardNumberEditId);
    number_->setMaxLength(32);
    deactivate_ = new QRadioButton("Deactivate", this);
    SetControlId(deactivate_, kForwardDeactivateRadioId);
    // The two choices are checked by hand, so that the dialog opens with neither.
    activate_->setAutoExclusive(false);
    deactivate_->setAutoExclusive(false);
    auto* timeRow = new QHBoxLayout();
    timeRow->addWidget(new QLabel("Time Out Limit", this));
    time_ = new QComboBox(this);
    SetControlId(time_, kForwardTimeListId);
    time_->addItems({"10", "20", "30"});
    time_->setCurrentIndex(1);
    time_->setEnabled(false);
    timeRow->addWidget(time_);
    layout->addWidget(activate_);
    layout->addWidget(number_);
    layout->addWidget(deactivate_);
    layout->addLayout(timeRow);
    layout->addStretch();
    auto* buttons = new QDialogButtonBox(this);
    buttons->addButton("Send Request", QDialogButtonBox::AcceptRole);
    buttons->addButton(QDialogButtonBox::Cancel);
    QObject::connect(buttons, &QDialogButtonBox::accepted, this, [this] { done(1); });
    QObject::connect(buttons, &QDialogButtonBox::rejected, this, [this] { done(-1); });
    layout->addWidget(buttons);
    QObject::connect(activate_, &QRadioButton::clicked, this, [this] { ChooseActivate(); });
    QObject::connect(deactivate_, &QRadioButton::clicked, this, [this] { ChooseDeactivate(); });
}

void ForwardDialog::ChooseActivate() {
    activate_->setChecked(true);
    deactivate_->setChecked(false);
    time_->setEnabled(reason_ == kForwardNoReply);
    char16_t stored[33] = u"";
    if (!GetSettingString(context_.settings, StoredNumberName(serviceClass_, reason_).c_str(),
                          stored, std::size(stored)))
        std::char_traits<char16_t>::copy(stored, kUnknown, std::size(kUnknown));
    number_->setText(QString::fromStdU16String(stored));
    number_->setFocus();
    number_->selectAll();
}

void ForwardDialog::ChooseDeactivate() {
    deactivate_->setChecked(true);
    activate_->setChecked(false);
    time_->setEnabled(false);
}

int ForwardDialog::Seconds() const {
    return reason_ == kForwardNoReply ? (time_->currentIndex() + 1) * 10 : 20;
}

std::u16string ForwardDialog::NumberProblem() const {
    if (!activate_->isChecked()) return {};
    const std::u16string number = number_->text().left(32).toStdU16String();
    if (IsValidPhoneNumber(number.c_str())) return {};
    // The edit opens on "Unknown" when no number was used before; the card would be asked to
    // forward to that text.
    constexpr char16_t kAsk[] = u"Please enter the number to forward the calls to.";
    if (number_->text().trimmed().isEmpty()) return kAsk;
    return u"\"" + number + u"\" is not a phone number.\n" + kAsk;
}

void ForwardDialog::done(int result) {
    if (result == 1) {
        const std::u16string problem = NumberProblem();
        if (!problem.empty()) {
            context_.dialogs.MessageBox(this, problem, kBoxTitle, kMbIconExclamation);
            number_->setFocus();
            number_->selectAll();
            return;
        }
    }
    QDialog::done(result);
}

// ForwardPage

ForwardPage::ForwardPage(QWidget* parent, ShellContext& context)
    : View(parent), context_(context), jobs_(this, context) {
    setObjectName("SETTINGS_CALLFORWARD_PAGE");
    if (parent) resize(parent->size());
    CreateClassPages(
        this, pages_, kForwardTabId, kPageClasses,
        [this](View* page, int index) { BuildSubPage(page, index); }, "Deactivate All Call Forward",
        kForwardDeactivateAllId, kRowHeight, [this] { DeactivateAll(); });
}

ForwardPage::~ForwardPage() = default;

long ForwardPage::OnMessage(unsigned msg, long wParam, long) {
    if (msg != kWmCommand) return 0;
    return TapControl(SubPage(pages_.current), this, static_cast<int>(wParam & 0xFFFF));
}

void ForwardPage::BuildSubPage(View* page, int index) {
    // Built before the tab strip places the sub-page, which then spans the page.
    const int width = this->width();
    const int editLeft = kMargin + kLabelWidth;
    const int buttonLeft = width - kMargin - kRowHeight;
    for (int reason = 0; reason < 4; ++reason) {
        const int top = kMargin + reason * kRowStep;
        auto* label = new QLabel(kRowLabels[reason], page);
        label->setGeometry(kMargin, top, kLabelWidth, kRowHeight);
        auto* state = new QLineEdit(Q(kUnknown), page);
        state->setReadOnly(true);
        SetControlId(state, kForwardStateFirstId + reason);
        state->setGeometry(editLeft, top, buttonLeft - editLeft - 4, kRowHeight);
        auto* button = new QPushButton("...", page);
        SetControlId(button, kForwardButtonFirstId + reason);
        button->setGeometry(buttonLeft, top, kRowHeight, kRowHeight);
        button->setToolTip("Change this forward");
        QObject::connect(button, &QPushButton::clicked, this,
                         [this, index, reason] { OpenRow(index, reason); });
    }
    const int top = kMargin + 4 * kRowStep + kMargin;
    auto* request = new QPushButton(QString("Request %1 Forward").arg(kClassNames[index]), page);
    SetControlId(request, kForwardRequestId);
    request->setGeometry(kMargin, top, width - 2 * kMargin, kRowHeight);
    QObject::connect(request, &QPushButton::clicked, this, [this, index] { Request(index); });
    auto* off = new QPushButton(QString("Deactivate All %1 Forward").arg(kClassNames[index]), page);
    SetControlId(off, kForwardDeactivateClassId);
    off->setGeometry(kMargin, top + 25, width - 2 * kMargin, kRowHeight);
    QObject::connect(off, &QPushButton::clicked, this, [this, index] { DeactivateClass(index); });
}

QLineEdit* ForwardPage::State(int index, int reason) const {
    return qobject_cast<QLineEdit*>(FindControl(SubPage(index), kForwardStateFirstId + reason));
}

QPushButton* ForwardPage::RowButton(int index, int reason) const {
    return qobject_cast<QPushButton*>(FindControl(SubPage(index), kForwardButtonFirstId + reason));
}

void ForwardPage::EnableConditionalRows(int index, bool enable) {
    for (int reason = 1; reason < 4; ++reason) {
        State(index, reason)->setEnabled(enable);
        RowButton(index, reason)->setEnabled(enable);
    }
}

void ForwardPage::Request(int index) {
    const int serviceClass = ClassOf(index);
    for (int reason = 0; reason < 4; ++reason) {
        auto number = std::make_shared<std::u16string>();
        jobs_.Run(
            [serviceClass, reason, number](Link& link) {
                char16_t text[33] = u"";
                const int result = QueryForward(link, serviceClass, reason, text, std::size(text));
                *number = text;
                return result;
            },
            [this, index, reason, number](int result) {
                State(index, reason)
                    ->setText(result == 1 ? Q(*number) : Q(result == 0 ? kNotActive : kUnknown));
                LogShown(
                    context_, "settings-forward",
                    QString("%1 %2 %3")
                        .arg(kClassNames[index], kRowLabels[reason], State(index, reason)->text()));
                // Unconditional forwarding takes every call, so the conditional ones do not
                // apply while it is on.
                if (reason == kForwardUnconditional && (result == 0 || result == 1))
                    EnableConditionalRows(index, result == 0);
            });
    }
}

void ForwardPage::OpenRow(int index, int reason) {
    const int serviceClass = ClassOf(index);
    ForwardDialog dialog(this, context_, serviceClass, reason, State(index, reason)->text());
    if (context_.dialogs.Run(&dialog) != 1) return;  // Cancel, or closed
    const bool activate = dialog.Activate()->isChecked();
    if (!activate && !dialog.Deactivate()->isChecked()) return;
    // A person cannot send such a number (the dialog stays open); a script's answer can.
    if (const std::u16string problem = dialog.NumberProblem(); !problem.empty()) {
        context_.dialogs.MessageBox(this, problem, kBoxTitle, kMbIconExclamation);
        return;  // the row keeps its text
    }
    const std::u16string number = dialog.Number()->text().left(32).toStdU16String();
    const int seconds = dialog.Seconds();
    jobs_.Run(
        [=](Link& link) {
            return activate ? ActivateForward(link, serviceClass, reason, number.c_str(), seconds)
                            : EraseForward(link, serviceClass, reason);
        },
        [=, this](int result) {
            if (CardFailed(result)) return;  // the row keeps its text
            if (activate)
                SetSettingString(context_.settings, StoredNumberName(serviceClass, reason).c_str(),
                                 number.c_str());
            State(index, reason)->setText(activate ? Q(number) : Q(kNotActive));
        });
}

void ForwardPage::DeactivateClass(int index) {
    const int serviceClass = ClassOf(index);
    jobs_.Run([serviceClass](Link& link) { return DisableAllForwards(link, serviceClass); },
              [this, index](int result) {
                  if (CardFailed(result)) return;
                  // Every reason of the class is off now, so every row says so.
                  EnableConditionalRows(index, true);
                  for (int reason = 0; reason < 4; ++reason)
                      State(index, reason)->setText(Q(kNotActive));
              });
}

void ForwardPage::DeactivateAll() {
    jobs_.Run([](Link& link) { return DisableAllForwardsAllClasses(link); },
              [this](int) {
                  // Marked off whatever the card answered.
                  for (int index = 0; index < kClasses; ++index) {
                      State(index, kForwardUnconditional)->setText(Q(kNotActive));
                      EnableConditionalRows(index, true);
                  }
              });
}

}  // namespace vqm
