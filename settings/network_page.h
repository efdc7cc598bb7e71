// The Network page of the Settings view: the operator the card is registered with, automatic or
// manual selection, the search for networks and registration with one of them. The commands
// are settings/network_at.h's; they run on the page's worker so the window keeps going while
// a search takes its time.
#pragma once

#include <cstdint>
#include <vector>

#include "settings/network_at.h"
#include "settings/settings_view.h"
#include "shell/main_window.h"
#include "shell/views.h"

class QLabel;
class QLineEdit;
class QListWidget;
class QPushButton;
class QRadioButton;

namespace vqm {

inline constexpr int kNetworkOperatorId = 1060, kNetworkAutomaticId = 1061, kNetworkManualId = 1062,
                     kNetworkListId = 1063, kNetworkSearchId = 1064, kNetworkRegisterId = 1065;
// More networks than any search hears; the rest of a longer reply is left out.
inline constexpr int kMaxNetworks = 128;

class NetworkPage : public View {
  public:
    NetworkPage(QWidget* parent, ShellContext& context);

    long OnMessage(unsigned msg, long wParam, long lParam) override;

    // The card is connected: the operator and the selection mode from the card.
    void Refresh();
    void Automatic();
    void Manual();
    void Search();
    void Register();

    QLineEdit* Operator() const { return operator_; }
    QListWidget* Networks() const { return networks_; }
    QRadioButton* AutomaticButton() const { return automatic_; }
    QRadioButton* ManualButton() const { return manual_; }
    QPushButton* SearchButton() const { return search_; }
    QPushButton* RegisterButton() const { return register_; }
    bool Searched() const { return searched_; }
    bool Busy() const { return exchange_.Busy(); }

  protected:
    void resizeEvent(QResizeEvent* event) override;

  private:
    void Relayout();
    void ShowMode(int mode);
    int Box(const char16_t* text, unsigned icon);
    // What the page shows, for the program's record of its window (--ui-log).
    void Log(const std::u16string& text);

    ShellContext& context_;
    // Set by the first search that worked and never cleared: Manual offers Register after it.
    bool searched_ = false;
    int mode_ = -1;
    // What the worker hands back, read on the window's thread once its answer arrives.
    std::u16string foundOperator_;
    int foundMode_ = -1;
    std::vector<std::u16string> foundNames_;
    std::vector<int32_t> foundCodes_;
    std::vector<int32_t> listedCodes_;
    QLabel* label_ = nullptr;
    QLineEdit* operator_ = nullptr;
    QRadioButton* automatic_ = nullptr;
    QRadioButton* manual_ = nullptr;
    QListWidget* networks_ = nullptr;
    QPushButton* search_ = nullptr;
    QPushButton* register_ = nullptr;
    CardExchange exchange_{this};
};

}  // namespace vqm
