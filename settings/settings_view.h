// The Settings view (SETTINGS_VIEW, view 4): nine pages under a tab strip along the bottom.
// Each page is a View built as (parent, context); the view hands every page the messages it
// gets (view shown, card state changed) and greys itself while the card is not connected.
#pragma once

#include <functional>

#include "shell/main_window.h"
#include "shell/views.h"

namespace vqm {

inline constexpr int kSettingsTabId = 1119;
inline constexpr int kSettingsPageCount = 9;
// The pages in tab order.
inline constexpr int kSettingsGeneral = 0, kSettingsMessages = 1, kSettingsNetwork = 2,
                     kSettingsCallForward = 3, kSettingsCallBarring = 4, kSettingsSecurity = 5,
                     kSettingsModem = 6, kSettingsCallWaiting = 7, kSettingsTones = 8;

class SettingsView : public View {
  public:
    SettingsView(QWidget* parent, ShellContext& context);

    long OnMessage(unsigned msg, long wParam, long lParam) override;

    ViewSet& Pages() { return pages_; }
    View* Page(int index) const;
    // Where the card state comes from; the main window's by default.
    void SetCardStateSource(std::function<int()> source);

  private:
    void FollowCardState();

    ShellContext& context_;
    std::function<int()> cardState_;
    ViewSet pages_;
};

}  // namespace vqm
