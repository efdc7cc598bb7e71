// The "Security" page of the Settings view (SETTINGS_SECURITY_PAGE): the phone lock and the
// SIM's PIN code request switched on and off, their states on Request Status, and the change
// of the PIN, PIN2, security code and barring password.
#pragma once

#include <QDialog>
#include <string>

#include "settings/barring_page.h"

class QComboBox;
class QLineEdit;
class QPushButton;

namespace vqm {

inline constexpr int kPhoneLockOnId = 1080, kPhoneLockOffId = 1081, kPinRequestOnId = 1082,
                     kPinRequestOffId = 1083, kRequestStatusId = 1084, kChangeCodeId = 1085;
// The dialogs' fields: 134 and 136 one code each, 137 the list and three codes.
inline constexpr int kSingleCodeEditId = 1172, kChangeListId = 1173, kOldCodeEditId = 1174,
                     kNewCodeEditId = 1175, kConfirmCodeEditId = 1176;

// Dialog 134 ("PIN Code Request", "PIN Code:") or 136 ("Change Phone Lock", "Security Code:").
class CodeDialog : public QDialog {
  public:
    CodeDialog(QWidget* parent, const char* objectName, const QString& title, const QString& label);
    QLineEdit* Code() const { return code_; }

  private:
    QLineEdit* code_;
};

// Dialog 137 ("Change Access Code").
class ChangeCodeDialog : public QDialog {
  public:
    explicit ChangeCodeDialog(QWidget* parent);
    QComboBox* Which() const { return which_; }
    QLineEdit* OldCode() const { return old_; }
    QLineEdit* NewCode() const { return new_; }
    QLineEdit* Confirm() const { return confirm_; }

  private:
    QComboBox* which_;
    QLineEdit* old_;
    QLineEdit* new_;
    QLineEdit* confirm_;
};

class SecurityPage : public View {
  public:
    SecurityPage(QWidget* parent, ShellContext& context);
    ~SecurityPage() override;
    long OnMessage(unsigned msg, long wParam, long lParam) override;

    QPushButton* Button(int id) const;
    const CardJobs& Jobs() const { return jobs_; }

    // mode 1 on, 0 off.
    void PinRequest(int mode);
    void PhoneLock(int mode);
    void RequestStatus();
    void ChangeAccessCode();

  private:
    void Box(const std::u16string& text);
    // Checks the on or off button of a pair by the lock's state; neither when it is unknown.
    void Mark(int onId, int offId, int state);

    ShellContext& context_;
    CardJobs jobs_;
};

}  // namespace vqm
