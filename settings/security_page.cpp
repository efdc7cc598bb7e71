#include "settings/security_page.h"

#include <QComboBox>
#include <QDialogButtonBox>
#include <QFormLayout>
#include <QLabel>
#include <QLineEdit>
#include <QPushButton>
#include <QVBoxLayout>
#include <memory>

#include "settings/security_at.h"
#include "shell/dialogs.h"
#include "shell/messages.h"

namespace vqm {

namespace {

constexpr char16_t kTitle[] = u"VQM Dialer";
constexpr int kPin = 0, kPin2 = 1, kSecurityCode = 2;
constexpr int kMargin = 5, kButtonHeight = 20, kRowStep = 26, kLabelWidth = 110;
constexpr char16_t kPinLengthRule[] = u"Password length must between 1 and 8!";

struct CodeRule {
    const char* entry;  // in the "Change:" list
    size_t low, high;
    const char16_t* message;
};
constexpr CodeRule kRules[kSecurityCodeCount] = {
    {"PIN code", 1, 8, kPinLengthRule},
    {"PIN2 code", 1, 8, kPinLengthRule},
    {"Security code", 5, 5, u"Password must be 5 digits long!"},
    {"Barring password", 4, 4, u"Password must be 4 digits long!"},
};

QLineEdit* CodeEdit(QWidget* parent, int id) {
    auto* edit = new QLineEdit(parent);
    SetControlId(edit, id);
    edit->setEchoMode(QLineEdit::Password);
    return edit;
}

QDialogButtonBox* OkCancel(QDialog* dialog) {
    auto* buttons = new QDialogButtonBox(QDialogButtonBox::Ok | QDialogButtonBox::Cancel, dialog);
    QObject::connect(buttons, &QDialogButtonBox::accepted, dialog, [dialog] { dialog->done(1); });
    QObject::connect(buttons, &QDialogButtonBox::rejected, dialog, [dialog] { dialog->done(2); });
    return buttons;
}

}  // namespace

CodeDialog::CodeDialog(QWidget* parent, const char* objectName, const QString& title,
                       const QString& label)
    : QDialog(parent) {
    setObjectName(objectName);
    setWindowTitle(title);
    auto* layout = new QVBoxLayout(this);
    layout->addWidget(new QLabel(label, this));
    code_ = CodeEdit(this, kSingleCodeEditId);
    layout->addWidget(code_);
    layout->addStretch();
    layout->addWidget(OkCancel(this));
}

ChangeCodeDialog::ChangeCodeDialog(QWidget* parent) : QDialog(parent) {
    setObjectName("CHANGE_ACCESS_CODE_DIALOG");
    setWindowTitle("Change Access Code");
    auto* layout = new QVBoxLayout(this);
    auto* form = new QFormLayout();
    which_ = new QComboBox(this);
    SetControlId(which_, kChangeListId);
    for (const CodeRule& rule : kRules)
        which_->addItem(rule.entry);
    old_ = CodeEdit(this, kOldCodeEditId);
    new_ = CodeEdit(this, kNewCodeEditId);
    confirm_ = CodeEdit(this, kConfirmCodeEditId);
    form->addRow("Change:", which_);
    form->addRow("Old Code:", old_);
    form->addRow("New Code:", new_);
    form->addRow("Confirm New Code:", confirm_);
    layout->addLayout(form);
    layout->addStretch();
    layout->addWidget(OkCancel(this));
}

SecurityPage::SecurityPage(QWidget* parent, ShellContext& context)
    : View(parent), context_(context), jobs_(this, context) {
    setObjectName("SETTINGS_SECURITY_PAGE");
    if (parent) resize(parent->size());
    const int half = (width() - 2 * kMargin - kLabelWidth) / 2;
    auto pair = [&](int row, const char* label, int onId, int offId) {
        const int top = kMargin + row * kRowStep;
        auto* text = new QLabel(label, this);
        text->setGeometry(kMargin, top, kLabelWidth, kButtonHeight);
        for (int id : {onId, offId}) {
            auto* button = new QPushButton(id == onId ? "On" : "Off", this);
            SetControlId(button, id);
            // Request Status checks the button of the state the card reported.
            button->setCheckable(true);
            button->setGeometry(kMargin + kLabelWidth + (id == onId ? 0 : half), top, half - 2,
                                kButtonHeight);
        }
    };
    pair(0, "Phone Lock:", kPhoneLockOnId, kPhoneLockOffId);
    pair(1, "PIN Code Request:", kPinRequestOnId, kPinRequestOffId);
    const int full = width() - 2 * kMargin;
    auto* status = new QPushButton("Request Status", this);
    SetControlId(status, kRequestStatusId);
    status->setGeometry(kMargin, kMargin + 2 * kRowStep + 8, full, kButtonHeight);
    auto* change = new QPushButton("Change Access Code", this);
    SetControlId(change, kChangeCodeId);
    change->setGeometry(kMargin, kMargin + 3 * kRowStep + 8, full, kButtonHeight);

    // A tap asks; it does not mark the button by itself: only the card's answer does.
    struct Action {
        int id;
        std::function<void()> run;
    };
    const Action actions[] = {
        {kPhoneLockOnId, [this] { PhoneLock(1); }},
        {kPhoneLockOffId, [this] { PhoneLock(0); }},
        {kPinRequestOnId, [this] { PinRequest(1); }},
        {kPinRequestOffId, [this] { PinRequest(0); }},
        {kRequestStatusId, [this] { RequestStatus(); }},
        {kChangeCodeId, [this] { ChangeAccessCode(); }},
    };
    for (const Action& action : actions) {
        QPushButton* button = Button(action.id);
        QObject::connect(button, &QPushButton::clicked, this, [button, run = action.run] {
            if (button->isCheckable()) button->setChecked(!button->isChecked());  // undo the tap's
            run();
        });
    }
}

SecurityPage::~SecurityPage() = default;

long SecurityPage::OnMessage(unsigned msg, long wParam, long) {
    if (msg != kWmCommand) return 0;
    return TapControl(nullptr, this, static_cast<int>(wParam & 0xFFFF));
}

QPushButton* SecurityPage::Button(int id) const {
    return qobject_cast<QPushButton*>(FindControl(const_cast<SecurityPage*>(this), id));
}

void SecurityPage::Box(const std::u16string& text) {
    context_.dialogs.MessageBox(this, text, kTitle, 0);
}

void SecurityPage::Mark(int onId, int offId, int state) {
    Button(onId)->setChecked(state == 1);
    Button(offId)->setChecked(state == 0);
    LogShown(context_, "settings-security",
             QString("%1 %2").arg(onId == kPinRequestOnId ? "pin-request" : "phone-lock",
                                  state == 1   ? "on"
                                  : state == 0 ? "off"
                                               : "unknown"));
}

void SecurityPage::PinRequest(int mode) {
    CodeDialog dialog(this, "PIN_CODE_REQUEST_DIALOG", "PIN Code Request", "PIN Code:");
    if (context_.dialogs.Run(&dialog) != 1) return;
    const std::u16string pin = dialog.Code()->text().toStdU16String();
    if (const std::u16string problem = CodeProblem(pin, 1, 8, kPinLengthRule); !problem.empty())
        return Box(problem);
    auto error = std::make_shared<CardError>();
    jobs_.Run([=](Link& link) { return SetLock(link, kPin, mode, pin.c_str(), error.get()); },
              [this, mode, error](int result) {
                  if (CardFailed(result))
                      Box(WithReason(u"Cannot change PIN Lock status!", *error));
                  else
                      Mark(kPinRequestOnId, kPinRequestOffId, mode);
              });
}

void SecurityPage::PhoneLock(int mode) {
    CodeDialog dialog(this, "CHANGE_PHONE_LOCK_DIALOG", "Change Phone Lock", "Security Code:");
    if (context_.dialogs.Run(&dialog) != 1) return;
    const std::u16string code = dialog.Code()->text().toStdU16String();
    if (const std::u16string problem = CodeProblem(code, 5, 5, kRules[kSecurityCode].message);
        !problem.empty())
        return Box(problem);
    auto error = std::make_shared<CardError>();
    jobs_.Run(
        [=](Link& link) { return SetLock(link, kSecurityCode, mode, code.c_str(), error.get()); },
        [this, mode, error](int result) {
            if (CardFailed(result))
                Box(WithReason(u"Cannot change Phone Lock status!", *error));
            else
                Mark(kPhoneLockOnId, kPhoneLockOffId, mode);
        });
}

void SecurityPage::RequestStatus() {
    struct Pair {
        int lock, onId, offId;
    };
    // One tap is told of at most once, though both queries may fail (a card that went away).
    auto told = std::make_shared<bool>(false);
    for (const Pair& pair : {Pair{kSecurityCode, kPhoneLockOnId, kPhoneLockOffId},
                             Pair{kPin, kPinRequestOnId, kPinRequestOffId}}) {
        auto error = std::make_shared<CardError>();
        jobs_.Run([=](Link& link) { return QueryLock(link, pair.lock, error.get()); },
                  [this, pair, error, told](int result) {
                      Mark(pair.onId, pair.offId, result);
                      // A blocked SIM and a card that went away are told, not just unmarked.
                      if (result == 0 || result == 1 || *told) return;
                      *told = true;
                      Box(WithReason(u"Request error", *error));
                  });
    }
}

void SecurityPage::ChangeAccessCode() {
    ChangeCodeDialog dialog(this);
    if (context_.dialogs.Run(&dialog) != 1) return;
    const int index = dialog.Which()->currentIndex();
    if (index < 0 || index >= kSecurityCodeCount) return;
    const std::u16string oldCode = dialog.OldCode()->text().toStdU16String();
    const std::u16string newCode = dialog.NewCode()->text().toStdU16String();
    if (newCode != dialog.Confirm()->text().toStdU16String())
        return Box(u"New code does not match.");
    const CodeRule& rule = kRules[index];
    // The old code meets the same rule: a code that cannot be right never goes to the card.
    for (const std::u16string* code : {&newCode, &oldCode})
        if (const std::u16string problem = CodeProblem(*code, rule.low, rule.high, rule.message);
            !problem.empty())
            return Box(problem);

    auto error = std::make_shared<CardError>();
    auto change = [this, index, oldCode, newCode, error] {
        jobs_.Run(
            [=](Link& link) {
                return ChangeCode(link, index, oldCode.c_str(), newCode.c_str(), error.get());
            },
            [this, error](int result) {
                if (CardFailed(result))
                    Box(WithReason(u"Cannot change code! Please check your old code.", *error));
            });
    };
    if (index != kPin && index != kPin2) return change();
    // A SIM changes a PIN only while its request is on: ask first.
    jobs_.Run([=](Link& link) { return QueryLock(link, index, error.get()); },
              [this, index, error, change](int state) {
                  if (state == 1) return change();
                  if (state != 0)
                      Box(WithReason(index == kPin ? u"Request error" : u"Request Error", *error));
                  else
                      Box(index == kPin ? u"You must set the PIN code request to on before "
                                          u"changing the PIN code!"
                                        : u"You must set the PIN code request to on before "
                                          u"changing the PIN2 code!");
              });
}

}  // namespace vqm
