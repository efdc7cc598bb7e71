// The SMS Folder view (SMSFOLDER_VIEW, view 2): five pages (Inbox, Outbox, Sent, Draft, PDA),
// each a list of messages with the message pane below it and the Reply, Forward and Delete
// buttons. It refreshes the SIM cache when it first comes up, takes in new messages, and files
// the transfer file into the page showing. The work is sms_folder.h's; this file shows it.
#pragma once

#include <QPixmap>
#include <array>
#include <functional>
#include <memory>
#include <vector>

#include "contacts/phonebook_cache.h"
#include "messaging/message_store.h"
#include "messaging/sms_folder.h"
#include "messaging/write_handoff.h"
#include "shell/main_window.h"
#include "shell/views.h"

class QLabel;
class QPushButton;
class QTextEdit;
class QTreeWidget;
class QTreeWidgetItem;

namespace vqm {

inline constexpr int kFolderTabId = 1300;
inline constexpr int kFolderListFirstId = 1301;     // 1301..1305, by page
inline constexpr int kFolderPaneFirstId = 1311;     // the message panes
inline constexpr int kFolderReplyFirstId = 1321;    // "Reply" ("Send" on the Outbox)
inline constexpr int kFolderForwardFirstId = 1331;  // "Forward"
inline constexpr int kFolderDeleteFirstId = 1341;   // "Delete"
// The list's columns: the four shown and the two that identify the message, unseen.
inline constexpr int kColumnFrom = 0, kColumnMessage = 1, kColumnDate = 2, kColumnMemory = 3,
                     kColumnRow = 4;
// The refresh state.
inline constexpr int kFolderNotRefreshed = 0, kFolderRefreshing = 1, kFolderRefreshed = 2;

// What the view needs from the rest of the program.
struct FolderViewHooks {
    // The full-SIM alert of the DialPad: 1 raises it, 0 clears it.
    std::function<void(int full)> simFullAlert;
    // Listing took messages out of "NewIdx"; the DialPad's notice may go.
    std::function<void()> newMessagesTaken;
    // Reply and Forward: the request goes to the Write SMS view, which comes up.
    std::function<void(WriteRequest request)> write;
};

class SmsFolderView : public View {
  public:
    SmsFolderView(QWidget* parent, ShellContext& context, PhonebookCaches* caches = nullptr,
                  FolderViewHooks hooks = {});
    ~SmsFolderView() override;

    long OnMessage(unsigned msg, long wParam, long lParam) override;

    // Fills the five lists from the store.
    void Reload();
    // Files the transfer file into the page showing.
    void Paste();
    void SelectPage(int page);
    int CurrentPage() const { return pages_.current; }
    // Selects and shows the first unread Inbox message; false when there is none.
    bool SelectFirstUnread();
    // The selection's commands, as the buttons run them.
    void Reply();
    void Forward();
    void DeleteSelected();
    void SendSelected();

    QTreeWidget* List(int page) const;
    QTextEdit* Pane(int page) const;
    const std::vector<FolderRow>& Rows(int page) const { return listing_.pages[page]; }
    int RefreshState() const { return refreshState_; }
    MessageStore& Store() { return store_; }
    ViewSet& Pages() { return pages_; }
    // Where the card state comes from; the main window's by default.
    void SetCardStateSource(std::function<int()> source) { cardState_ = std::move(source); }

  protected:
    void resizeEvent(QResizeEvent* event) override;

  private:
    View* MakePage(QWidget* parent, int page);
    void Relayout();
    void ShowSelected(int page);
    const FolderRow* CurrentRow(int page) const;
    std::vector<FolderRow> SelectedRows(int page) const;
    FolderUi Ui();
    void ShowBox(const std::u16string& text, const std::u16string& title);
    // An exchange with the card, run aside so the window keeps painting and taking rings.
    int OnCard(const std::function<int()>& work);
    void BeginBusy();
    void EndBusy();
    void OnCardState();
    void StartRefresh();
    void JoinRefresh();
    void OnRefreshDone();
    void OnOutsideCommand(int id);
    std::u16string NameOf(const char* number);
    void EnableSimButtons(bool enable);

    ShellContext& context_;
    std::unique_ptr<PhonebookCaches> ownCaches_;
    PhonebookCaches* caches_;
    FolderViewHooks hooks_;
    MessageStore store_;
    ViewSet pages_;
    FolderListing listing_;
    std::array<QTreeWidget*, kPageCount> lists_{};
    std::array<QTextEdit*, kPageCount> panes_{};
    std::array<QPushButton*, kPageCount> replies_{}, forwards_{}, deletes_{};
    QPixmap unreadImage_;
    std::function<int()> cardState_;
    int refreshState_ = kFolderNotRefreshed;
    bool selecting_ = false;
};

}  // namespace vqm
