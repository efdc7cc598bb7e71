// The Messages page of the Settings view: the user's message centres, one of them chosen or the
// SIM's own, pushed to the card when the page loads on a connected card and when the choice
// changes. The list and its keys are settings/centres.h's; this file shows and edits them and
// runs the card exchanges on a worker so the window keeps going while the card answers.
#pragma once

#include <QDialog>

#include "settings/centres.h"
#include "settings/settings_view.h"
#include "shell/main_window.h"
#include "shell/views.h"

class QCheckBox;
class QComboBox;
class QLabel;
class QLineEdit;
class QPushButton;
class QTreeWidget;

namespace vqm {

inline constexpr int kCentreListId = 1100;
inline constexpr int kCentreNewId = 1101, kCentreEditId = 1102, kCentreDeleteId = 1103,
                     kCentreSelectId = 1104, kCentreUseSimId = 1105;
// The check image of a row: 1 marks the chosen centre.
inline constexpr int kCentreImageRole = Qt::UserRole;

// Dialog 135: one centre's name, number, validity and "Sent As".
class CentreDialog : public QDialog {
  public:
    CentreDialog(QWidget* parent, const CentreEntry& entry);
    CentreEntry Entry() const;

    QLineEdit* name = nullptr;
    QLineEdit* number = nullptr;
    QComboBox* validity = nullptr;
    QComboBox* sendAs = nullptr;
};

class CentrePage : public View {
  public:
    CentrePage(QWidget* parent, ShellContext& context);

    long OnMessage(unsigned msg, long wParam, long lParam) override;

    // The list from the settings, and the chosen centre (or the SIM's default) pushed to the
    // card when it is connected.
    void Load(bool pushToCard);
    void NewCentre();
    void EditCentre();
    // Removes the selected centre; when it was the one the card uses, the card is given the
    // SIM's own centre instead ("Use SIM Default" checked).
    void DeleteCentre();
    // Pushes row's centre to the card; only when the card takes it does the row become chosen.
    void Select(int row);
    void UseSimDefault(bool use);

    QTreeWidget* List() const { return list_; }
    const CentreList& Centres() const { return centres_; }
    // An exchange with the card is under way (the wait cursor shows).
    bool Busy() const { return exchange_.Busy(); }

  protected:
    void resizeEvent(QResizeEvent* event) override;

  private:
    void Relayout();
    void Fill();
    void EnableButtons();
    int SelectedRow() const;
    // The dialog until it is cancelled or gives a number; false when cancelled.
    bool AskEntry(CentreEntry* entry);
    void MarkChosen(int chosen);
    // What the page did, for the program's record of its window (--ui-log).
    void Log(const std::u16string& text);

    ShellContext& context_;
    CentreList centres_;
    // Declared last of the state the answers use, so it is gone (joined) before them.
    QLabel* label_ = nullptr;
    QTreeWidget* list_ = nullptr;
    QPushButton* newButton_ = nullptr;
    QPushButton* editButton_ = nullptr;
    QPushButton* deleteButton_ = nullptr;
    QPushButton* selectButton_ = nullptr;
    QCheckBox* useSim_ = nullptr;
    CardExchange exchange_{this};
};

}  // namespace vqm
