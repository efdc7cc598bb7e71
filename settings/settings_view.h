// The Settings view (SETTINGS_VIEW, view 4): nine pages under a tab strip along the bottom.
// Each page is a View built as (parent, context); the view hands every page the messages it
// gets (view shown, card state changed) and greys itself while the card is not connected.
#pragma once

#include <functional>

#include "calls/card_worker.h"
#include "shell/main_window.h"
#include "shell/views.h"

namespace vqm {

inline constexpr int kSettingsTabId = 1119;
inline constexpr int kSettingsPageCount = 9;
// The pages in tab order.
inline constexpr int kSettingsGeneral = 0, kSettingsMessages = 1, kSettingsNetwork = 2,
                     kSettingsCallForward = 3, kSettingsCallBarring = 4, kSettingsSecurity = 5,
                     kSettingsModem = 6, kSettingsCallWaiting = 7, kSettingsTones = 8;
// Commands from outside (a script driving the dialer through its socket, as a tap would):
// 1110 + n brings page n forward; 1300 + n picks row n of the list on the page in front. Every
// other command goes to the page in front as its control's click.
inline constexpr int kSettingsPageCommandFirst = 1110;
inline constexpr int kSettingsRowCommandFirst = 1300, kSettingsRowCommandCount = 200;

// A page's exchanges with the card: each runs on the page's own worker with the wait cursor
// shown, and its result comes back to done on the window's thread, so the window keeps
// painting while the card answers. One at a time: Run refuses while one is under way.
class CardExchange {
  public:
    explicit CardExchange(QObject* owner) : owner_(owner) {}
    // Waits for the exchange under way (the link bounds it); its result is dropped.
    ~CardExchange();
    CardExchange(const CardExchange&) = delete;
    CardExchange& operator=(const CardExchange&) = delete;

    bool Busy() const { return busy_; }
    bool Run(std::function<int()> work, std::function<void(int result)> done);

  private:
    QObject* owner_;
    bool busy_ = false;
    CardWorker worker_;
};

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
