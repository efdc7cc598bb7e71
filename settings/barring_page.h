// The "Call Barring" page of the Settings view: Voice, Data and Fax sub-pages that bar and lift
// outgoing and incoming calls with the network's barring password, show each facility's state
// on Request, and "Disable All Call Barrings" below them.
#pragma once

#include <QDialog>
#include <string>

#include "settings/at_common.h"
#include "settings/forward_page.h"

class QLabel;
class QLineEdit;
class QPushButton;

namespace vqm {

inline constexpr int kBarringTabId = 1089;
// Sub-page buttons.
inline constexpr int kBarInternationalId = 1090, kBarExceptHomeId = 1091, kBarAllOutgoingId = 1092,
                     kLiftOutgoingId = 1093, kBarRoamingId = 1094, kBarAllIncomingId = 1095,
                     kLiftIncomingId = 1096, kBarringRequestId = 1097, kLiftClassId = 1098;
// Below the tabs.
inline constexpr int kLiftAllBarringsId = 1099;
// Beside each barring button, its facility's state: the button's id + 100.
inline constexpr int kBarringMarkOffset = 100;
// Dialog 139's password field.
inline constexpr int kPasswordEditId = 1171;

// "Enter Access Code": one password, as typed.
class PasswordDialog : public QDialog {
  public:
    explicit PasswordDialog(QWidget* parent);
    QLineEdit* Password() const { return password_; }

  private:
    QLineEdit* password_;
};

// The texts of a code check: empty when code may go to the card, else the message to show.
// The length rule comes first with its own message; characters other than digits are refused
// after it with one message of our own, so that nothing but digits ever reaches the card.
std::u16string CodeProblem(const std::u16string& code, size_t low, size_t high,
                           const std::u16string& lengthMessage);

// A failure's text with the card's reason on a second line when it gave one.
std::u16string WithReason(const std::u16string& text, const CardError& error);

class BarringPage : public View {
  public:
    static constexpr int kClasses = 3;

    BarringPage(QWidget* parent, ShellContext& context);
    ~BarringPage() override;
    long OnMessage(unsigned msg, long wParam, long lParam) override;

    View* SubPage(int index) const { return pages_.records[index].window; }
    static int ClassOf(int index) { return 1 << index; }
    // The mark beside a barring button: "✓" barred, empty not barred, "?" unknown.
    QLabel* Mark(int index, int buttonId) const;
    const CardJobs& Jobs() const { return jobs_; }

    void Bar(int index, int buttonId);
    void Lift(int index, int buttonId);
    void Request(int index);
    void LiftAll();

  private:
    void BuildSubPage(View* page, int index);
    // Asks for the password: it, or nullopt when the dialog was cancelled or the password
    // broke a rule (the message has been shown then).
    bool AskPassword(std::u16string* password);
    void Box(const std::u16string& text, unsigned style);

    ShellContext& context_;
    ViewSet pages_;
    CardJobs jobs_;
};

}  // namespace vqm
