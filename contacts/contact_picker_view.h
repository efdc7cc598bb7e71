// The contact picker (CONTACTS_VIEW, view 6): the SIM Card, Card Phone and Outlook (Mobile,
// Home, Work) lists from the phonebook caches, each row with a check box, "Select All" and
// "Clear All" on tap and hold, and OK / Cancel back to the Write SMS view. The decisions are
// contacts/contact_picker.h's.
#pragma once

#include <QPoint>
#include <array>
#include <functional>
#include <memory>
#include <string>

#include "contacts/cache_builders.h"
#include "contacts/contact_picker.h"
#include "shell/main_window.h"
#include "shell/views.h"

class QMenu;
class QPushButton;
class QTreeWidget;

namespace vqm {

inline constexpr int kPickerTabId = 1150, kPickerOutlookTabId = 1151;
inline constexpr int kPickerListFirstId = 1152;  // + page
inline constexpr int kPickerOkId = 1160, kPickerCancelId = 1161;
inline constexpr int kCmdPickerSelectAll = 40041, kCmdPickerClearAll = 40042;

struct PickerHooks {
    // OK: the recipients text of the ticked rows (perhaps empty) for the Write SMS view.
    std::function<void(const std::u16string& recipients)> pick;
    // Cancel: back to the Write SMS view with nothing added.
    std::function<void()> cancel;
};

class ContactPickerView : public View {
  public:
    ContactPickerView(QWidget* parent, ShellContext& context, PhonebookCaches* caches = nullptr,
                      PickerHooks hooks = {});
    ~ContactPickerView() override;

    long OnMessage(unsigned msg, long wParam, long lParam) override;

    QTreeWidget* List(int page) const;
    void ShowPage(int page);
    int CurrentPage() const;
    void LoadPage(int page);
    // Ticks every row of a page, or clears them.
    void TickAll(int page, bool ticked);
    // The tap-and-hold menu of a page, ready for a tap at pos (list viewport coordinates).
    QMenu* PrepareMenu(int page, QPoint pos);
    void Ok();
    void Cancel();

    const PickerLoadState& LoadState() const { return state_; }
    void SetCardStateSource(std::function<int()> source) { cardState_ = std::move(source); }

  protected:
    void resizeEvent(QResizeEvent* event) override;

  private:
    QTreeWidget* MakeList(QWidget* page, int index);
    void Relayout();
    void Do(unsigned work);
    CacheNotify Notifier();

    ShellContext& context_;
    std::unique_ptr<PhonebookCaches> ownCaches_;
    PhonebookCaches* caches_;
    std::shared_ptr<MessageLayer> messages_;
    PickerHooks hooks_;
    std::function<int()> cardState_;
    PickerLoadState state_;
    PickerRows rows_;
    ViewSet pages_;
    ViewSet outlookPages_;
    std::array<QTreeWidget*, kPickerPageCount> lists_{};
    std::array<QMenu*, kPickerPageCount> menus_{};
    QPushButton* ok_ = nullptr;
    QPushButton* cancel_ = nullptr;
};

}  // namespace vqm
