#include "settings/barring_page.h"

#include <QDialogButtonBox>
#include <QLabel>
#include <QLineEdit>
#include <QPushButton>
#include <QVBoxLayout>
#include <memory>

#include "settings/barring_at.h"
#include "shell/dialogs.h"
#include "shell/messages.h"

namespace vqm {

namespace {

constexpr unsigned kMbIconStop = 0x10;
constexpr char16_t kTitle[] = u"VQM Dialer";
constexpr const char* kClassTitles[BarringPage::kClasses] = {"Voice", "Data", "Fax"};
// The names that fill the "%s" of the failure messages.
constexpr const char16_t* kClassNames[BarringPage::kClasses] = {u"voice", u"data", u"fax"};
constexpr const char* kPageClasses[BarringPage::kClasses] = {"SETTINGS_CALLBARRING_VOICE_PAGE",
                                                             "SETTINGS_CALLBARRING_DATA_PAGE",
                                                             "SETTINGS_CALLBARRING_FAX_PAGE"};
constexpr int kMargin = 5, kButtonHeight = 20, kStep = 22, kMarkWidth = 14, kLabelHeight = 16;
constexpr int kAllOutgoing = 6, kAllIncoming = 7, kAllBarrings = 5;

struct BarButton {
    int id;
    const char* caption;
    int facility;
    int column, row;  // within its group
};
// Outgoing group first, then incoming; the lifting buttons take the place after their group's
// barring buttons.
constexpr BarButton kButtons[] = {
    {kBarInternationalId, "International", 1, 0, 0},
    {kBarExceptHomeId, "All Except Home", 2, 1, 0},
    {kBarAllOutgoingId, "All Calls", 0, 0, 1},
    {kLiftOutgoingId, "Disable Outgoing", kAllOutgoing, 1, 1},
    {kBarRoamingId, "When Roaming", 4, 0, 0},
    {kBarAllIncomingId, "All Calls", 3, 1, 0},
    {kLiftIncomingId, "Disable Incoming", kAllIncoming, 0, 1},
};
// The barring buttons whose facility Request shows, in the order it asks.
constexpr int kShownButtons[] = {kBarInternationalId, kBarExceptHomeId, kBarAllOutgoingId,
                                 kBarRoamingId, kBarAllIncomingId};

const BarButton* ButtonOf(int id) {
    for (const BarButton& button : kButtons)
        if (button.id == id) return &button;
    return nullptr;
}

bool IsDigits(const std::u16string& code) {
    for (char16_t c : code)
        if (c < u'0' || c > u'9') return false;
    return true;
}

std::u16string Fill(const std::u16string& format, const std::u16string& name) {
    std::u16string text = format;
    const size_t at = text.find(u"%s");
    if (at != std::u16string::npos) text.replace(at, 2, name);
    return text;
}

}  // namespace

std::u16string CodeProblem(const std::u16string& code, size_t low, size_t high,
                           const std::u16string& lengthMessage) {
    if (code.size() < low || code.size() > high) return lengthMessage;
    if (!IsDigits(code)) return u"A code may hold digits only (0 to 9).";
    return {};
}

std::u16string WithReason(const std::u16string& text, const CardError& error) {
    const char* reason = CardErrorReason(error);
    if (!*reason) return text;
    std::u16string wide;
    for (const char* p = reason; *p; ++p)
        wide += static_cast<char16_t>(static_cast<unsigned char>(*p));
    return text + u"\n" + wide;
}

// PasswordDialog

PasswordDialog::PasswordDialog(QWidget* parent) : QDialog(parent) {
    setObjectName("ENTER_ACCESS_CODE_DIALOG");
    setWindowTitle("Enter Access Code");
    auto* layout = new QVBoxLayout(this);
    layout->addWidget(new QLabel("Please Enter Your Password:", this));
    password_ = new QLineEdit(this);
    SetControlId(password_, kPasswordEditId);
    password_->setEchoMode(QLineEdit::Password);
    layout->addWidget(password_);
    layout->addStretch();
    auto* buttons = new QDialogButtonBox(QDialogButtonBox::Ok | QDialogButtonBox::Cancel, this);
    QObject::connect(buttons, &QDialogButtonBox::accepted, this, [this] { done(1); });
    QObject::connect(buttons, &QDialogButtonBox::rejected, this, [this] { done(2); });
    layout->addWidget(buttons);
}

// BarringPage

BarringPage::BarringPage(QWidget* parent, ShellContext& context)
    : View(parent), context_(context), jobs_(this, context) {
    setObjectName("SETTINGS_CALLBARRING_PAGE");
    if (parent) resize(parent->size());
    CreateClassPages(
        this, pages_, kBarringTabId, kPageClasses,
        [this](View* page, int index) { BuildSubPage(page, index); }, "Disable All Call Barrings",
        kLiftAllBarringsId, kButtonHeight, [this] { LiftAll(); });
}

BarringPage::~BarringPage() = default;

long BarringPage::OnMessage(unsigned msg, long wParam, long) {
    if (msg != kWmCommand) return 0;
    return TapControl(SubPage(pages_.current), this, static_cast<int>(wParam & 0xFFFF));
}

void BarringPage::BuildSubPage(View* page, int index) {
    // Built before the tab strip places the sub-page, which then spans the page.
    const int width = this->width();
    const int column = (width - 2 * kMargin) / 2;
    int top = kMargin;
    for (int group = 0; group < 2; ++group) {
        auto* label = new QLabel(group == 0 ? "Outgoing Calls:" : "Incoming Calls:", page);
        label->setGeometry(kMargin, top, width - 2 * kMargin, kLabelHeight);
        top += kLabelHeight + 2;
        for (const BarButton& entry : kButtons) {
            const bool outgoing = entry.id <= kLiftOutgoingId;
            if (outgoing != (group == 0)) continue;
            const int left = kMargin + entry.column * column;
            const int y = top + entry.row * kStep;
            const bool lifts = entry.facility >= kAllBarrings;
            auto* button = new QPushButton(entry.caption, page);
            SetControlId(button, entry.id);
            if (lifts) {
                button->setGeometry(left, y, column - 2, kButtonHeight);
                QObject::connect(button, &QPushButton::clicked, this,
                                 [this, index, id = entry.id] { Lift(index, id); });
            } else {
                // The facility's state stands in front of its button.
                auto* mark = new QLabel(page);
                SetControlId(mark, entry.id + kBarringMarkOffset);
                mark->setAlignment(Qt::AlignCenter);
                mark->setGeometry(left, y, kMarkWidth, kButtonHeight);
                button->setGeometry(left + kMarkWidth, y, column - kMarkWidth - 2, kButtonHeight);
                QObject::connect(button, &QPushButton::clicked, this,
                                 [this, index, id = entry.id] { Bar(index, id); });
            }
        }
        top += 2 * kStep + 4;
    }
    auto* request =
        new QPushButton(QString("Request %1 Call Barrings").arg(kClassTitles[index]), page);
    SetControlId(request, kBarringRequestId);
    request->setGeometry(kMargin, top, width - 2 * kMargin, kButtonHeight);
    QObject::connect(request, &QPushButton::clicked, this, [this, index] { Request(index); });
    auto* off =
        new QPushButton(QString("Disable All %1 Call Barrings").arg(kClassTitles[index]), page);
    SetControlId(off, kLiftClassId);
    off->setGeometry(kMargin, top + 25, width - 2 * kMargin, kButtonHeight);
    QObject::connect(off, &QPushButton::clicked, this,
                     [this, index] { Lift(index, kLiftClassId); });
}

QLabel* BarringPage::Mark(int index, int buttonId) const {
    return qobject_cast<QLabel*>(FindControl(SubPage(index), buttonId + kBarringMarkOffset));
}

void BarringPage::Box(const std::u16string& text, unsigned style) {
    context_.dialogs.MessageBox(this, text, kTitle, style);
}

bool BarringPage::AskPassword(std::u16string* password) {
    PasswordDialog dialog(this);
    if (context_.dialogs.Run(&dialog) != 1) return false;
    *password = dialog.Password()->text().toStdU16String();
    const std::u16string problem = CodeProblem(*password, 4, 4, u"Password must be 4 digits long!");
    if (problem.empty()) return true;
    Box(problem, 0);
    return false;
}

void BarringPage::Bar(int index, int buttonId) {
    const BarButton* button = ButtonOf(buttonId);
    std::u16string password;
    if (!button || button->facility >= kAllBarrings || !AskPassword(&password)) return;
    const int serviceClass = ClassOf(index), facility = button->facility;
    auto error = std::make_shared<CardError>();
    jobs_.Run(
        [=](Link& link) {
            return LockBarring(link, serviceClass, facility, password.c_str(), error.get());
        },
        [this, index, error](int result) {
            if (CardFailed(result))
                Box(WithReason(u"Activation Error!\nPlease check your password.", *error), 0);
            else
                Request(index);
        });
}

void BarringPage::Lift(int index, int buttonId) {
    const int facility = buttonId == kLiftClassId      ? kAllBarrings
                         : buttonId == kLiftOutgoingId ? kAllOutgoing
                         : buttonId == kLiftIncomingId ? kAllIncoming
                                                       : -1;
    std::u16string password;
    if (facility < 0 || !AskPassword(&password)) return;
    const int serviceClass = ClassOf(index);
    auto error = std::make_shared<CardError>();
    jobs_.Run(
        [=](Link& link) {
            return UnlockBarring(link, serviceClass, facility, password.c_str(), error.get());
        },
        [this, index, facility, error](int result) {
            if (!CardFailed(result)) return Request(index);
            const char16_t* format =
                facility == kAllOutgoing   ? u"Cannot disable %s outgoing barring."
                : facility == kAllIncoming ? u"Cannot disable %s incoming barring."
                                           : u"Cannot disable all %s barring.";
            Box(WithReason(Fill(format, kClassNames[index]), *error), kMbIconStop);
        });
}

void BarringPage::Request(int index) {
    const int serviceClass = ClassOf(index);
    for (int id : kShownButtons) {
        const int facility = ButtonOf(id)->facility;
        jobs_.Run([=](Link& link) { return QueryBarring(link, serviceClass, facility); },
                  [this, index, id](int result) {
                      Mark(index, id)->setText(result == 1   ? QString::fromUtf8("\u2713")
                                               : result == 0 ? QString()
                                                             : QString("?"));
                      LogShown(context_, "settings-barring",
                               QString("%1 %2 %3")
                                   .arg(kClassTitles[index], ButtonOf(id)->caption,
                                        result == 1   ? "barred"
                                        : result == 0 ? "not-barred"
                                                      : "unknown"));
                  });
    }
}

void BarringPage::LiftAll() {
    std::u16string password;
    if (!AskPassword(&password)) return;
    auto error = std::make_shared<CardError>();
    jobs_.Run([=](Link& link) { return UnlockAllBarrings(link, password.c_str(), error.get()); },
              [this, error](int result) {
                  if (CardFailed(result)) {
                      Box(WithReason(u"Cannot disable all barring.", *error), 0);
                      return;
                  }
                  // Nothing is barred for any class now.
                  for (int index = 0; index < kClasses; ++index)
                      for (int id : kShownButtons)
                          Mark(index, id)->setText(QString());
              });
}

}  // namespace vqm
