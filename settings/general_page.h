// The General page of the Settings view: whether the contacts view reloads the SIM and card
// phonebooks, and the desktop address book, when it starts. Each box is its setting, written
// the moment it is clicked.
#pragma once

#include "shell/main_window.h"
#include "shell/views.h"

class QCheckBox;
class QLabel;

namespace vqm {

inline constexpr int kGeneralRefreshSimId = 1120;
inline constexpr int kGeneralRefreshOutlookId = 1121;

class GeneralPage : public View {
  public:
    GeneralPage(QWidget* parent, ShellContext& context);

    long OnMessage(unsigned msg, long wParam, long lParam) override;
    QCheckBox* Box(int id) const;

  protected:
    void resizeEvent(QResizeEvent* event) override;

  private:
    void Relayout();

    ShellContext& context_;
    QLabel* title_ = nullptr;
    QCheckBox* refreshSim_ = nullptr;
    QCheckBox* refreshOutlook_ = nullptr;
    QLabel* simLabel_ = nullptr;
    QLabel* outlookLabel_ = nullptr;
};

}  // namespace vqm
