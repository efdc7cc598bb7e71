// The Modem page of the Settings view: how data calls made through the card's modem driver are
// set up, by connection method and HSCSD speed. The choice becomes one command line that goes
// to the "ATModemCmd" setting, the driver's init value and wvdial's Init3; the card itself is
// sent nothing.
#pragma once

#include "settings/modem_at.h"
#include "shell/main_window.h"
#include "shell/views.h"

class QLabel;
class QListWidget;
class QRadioButton;

namespace vqm {

inline constexpr int kModemDownloadId = 1047, kModemUploadId = 1049, kModemHscsdId = 1050;
inline constexpr int kModemMethodFirstId = 1051;  // 1051 "Modem", 1052, 1053 the ISDN methods
inline constexpr int kModemSpeedListId = 1054;

class ModemPage : public View {
  public:
    // files: where the command goes; the user's own places when not given.
    ModemPage(QWidget* parent, ShellContext& context);
    ModemPage(QWidget* parent, ShellContext& context, ModemDriverFiles files);
    // Leaving writes the command of what the page shows, as every click does.
    ~ModemPage() override;

    long OnMessage(unsigned msg, long wParam, long lParam) override;

    // The list's selection changed: labels follow the speed, and the command is written.
    void UpdateModemPage();

    QRadioButton* Method(int method) const;
    QListWidget* Speeds() const { return speeds_; }

  protected:
    void resizeEvent(QResizeEvent* event) override;

  private:
    void Build();
    void Relayout();
    // Method from the buttons, speed from the list, both stored, and the command written.
    void Store(int* method, int* speed);

    ShellContext& context_;
    ModemDriverFiles files_;
    QLabel* title_ = nullptr;
    QLabel* methodsLabel_ = nullptr;
    QLabel* speedLabel_ = nullptr;
    QRadioButton* methods_[kModemMethodCount] = {};
    QListWidget* speeds_ = nullptr;
    QLabel* download_ = nullptr;
    QLabel* upload_ = nullptr;
    QLabel* hscsd_ = nullptr;
};

}  // namespace vqm
