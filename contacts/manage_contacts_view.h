// The Manage Contacts view (MANAGECONTACTS_VIEW, view 3): the SIM Card, Card Phone and Outlook
// (Mobile, Home, Work) pages listed from the phonebook caches, a Find row above them, and per
// page a tap-and-hold menu to create, edit, copy, delete, call and message contacts, refresh a
// page, and take a phonebook in from or out to a vCard file. It drives the cache builders
// (contacts/cache_builders.h) on the card's state and its own activation; the decisions are
// contacts/manage_contacts.h's.
#pragma once

#include <QDialog>
#include <QPoint>
#include <array>
#include <functional>
#include <memory>
#include <mutex>
#include <string>
#include <vector>

#include "contacts/cache_builders.h"
#include "contacts/manage_contacts.h"
#include "shell/main_window.h"
#include "shell/views.h"

class QLabel;
class QLineEdit;
class QMenu;
class QPushButton;
class QTreeWidget;
class QTreeWidgetItem;

namespace vqm {

struct PhonebookEntry;

// Controls of the view.
inline constexpr int kContactsFindEditId = 1127, kContactsFindButtonId = 1128;
inline constexpr int kContactsTabId = 1129, kContactsOutlookTabId = 1130;
inline constexpr int kContactsListFirstId = 1131;  // + page
// The dialogs' controls.
inline constexpr int kContactNameEditId = 1201, kContactNumberEditId = 1202;
inline constexpr int kContactReasonId = 1203, kContactOldNameId = 1204, kContactOldNumberId = 1205;

// Pages by list.
inline constexpr int kContactsSimPage = 0, kContactsCardPage = 1, kContactsMobilePage = 2,
                     kContactsHomePage = 3, kContactsWorkPage = 4, kContactsPageCount = 5;
// Columns: what is shown, and the storage code and index the commands work from.
inline constexpr int kContactsColumnName = 0, kContactsColumnPhone = 1, kContactsColumnStorage = 2,
                     kContactsColumnIndex = 3;

// Menu commands.
inline constexpr int kCmdContactNew = 40021, kCmdContactEdit = 40015, kCmdContactCall = 40019,
                     kCmdContactMessage = 40028, kCmdContactCopyToSim = 40010,
                     kCmdContactCopyToCard = 40011, kCmdContactDelete = 40013,
                     kCmdContactRefresh = 40023;
// The vCard commands of the SIM Card and Card Phone pages.
inline constexpr int kCmdContactImport = 40031, kCmdContactExport = 40032;

// The refusal of New, Copy To and Import while the SIM and Card Phone lists are not read whole.
inline constexpr char16_t kContactsStillReadingText[] =
    u"The SIM Card and Card Phone contacts are still being read. Please try again once they "
    u"are listed.";

// The New/Edit dialog ("New Contacts" / "Edit Contacts") and the "Copy Contacts" dialog, which
// adds the reason and the old name and number above the fields. OK runs the check first, so a
// person sees the message and keeps the dialog.
class ContactDialog : public QDialog {
  public:
    ContactDialog(QWidget* parent, const QString& title, const QString& reason = {},
                  const QString& oldName = {}, const QString& oldNumber = {});
    QLineEdit* Name() const { return name_; }
    QLineEdit* Number() const { return number_; }
    // Called by OK; the dialog closes only when it returns true.
    std::function<bool()> check;

    void accept() override;

  private:
    QLineEdit* name_;
    QLineEdit* number_;
};

class ManageContactsView : public View {
  public:
    using DialFunction = std::function<int(const std::u16string& number)>;
    // Hands "name<number>;\r\n" to the Write SMS view (HandToWriteSms in the program).
    using WriteMessageFunction = std::function<void(const std::u16string& recipients)>;

    // caches are the program's shared ones when given; otherwise the view keeps its own.
    ManageContactsView(QWidget* parent, ShellContext& context, PhonebookCaches* caches = nullptr,
                       DialFunction dial = {}, WriteMessageFunction writeMessage = {});
    ~ManageContactsView() override;

    long OnMessage(unsigned msg, long wParam, long lParam) override;
    // A menu command on the page shown.
    void Command(int id);

    QTreeWidget* List(int page) const;
    // The page whose list is shown (the inner Outlook page when Outlook is up).
    int CurrentPage() const;
    // The vCard commands of the page in front, in the main window's File menu as well.
    std::vector<FileMenuEntry> FileMenuEntries() override;
    void ShowPage(int page);
    // Fills a page's list from its cache file.
    void LoadPage(int page);
    // The menu of a page, made ready for a tap at pos (list viewport coordinates).
    QMenu* PrepareMenu(int page, QPoint pos);
    void Find();

    const ContactsLoadState& LoadState() const { return state_; }
    // The SIM Card and Card Phone lists are read whole, their limits learnt, and no build of
    // their cache runs: only then are the free place and the limits that New, Copy To and
    // Import work with known.
    bool SimBooksReady() const;
    PhonebookCaches& Caches() { return *caches_; }
    void SetCardStateSource(std::function<int()> source) { cardState_ = std::move(source); }
    // Where the Outlook builder reads the address book from; the desktop's by default.
    void SetAddressBookReader(AddressBookReader reader) { readAddressBook_ = std::move(reader); }
    // The vCard file of Import/Export; a file dialog asks a person when none is set.
    void SetVCardPathSource(std::function<std::string(bool forSaving)> source) {
        vcardPath_ = std::move(source);
    }
    // Waits for the builders, delivering their reports meanwhile.
    void WaitForBuilders();

  protected:
    void resizeEvent(QResizeEvent* event) override;

  private:
    struct Row {
        std::u16string name, number, storage;
        int index = 0;
    };

    QTreeWidget* MakeList(QWidget* page, int index);
    void Relayout();
    void Do(unsigned work);
    void EmptyList(int page);
    void LearnGeometry();
    std::vector<QTreeWidgetItem*> ChosenRows(int page) const;
    // An exchange with the card, run aside so the window keeps painting and taking rings.
    int OnCard(const std::function<int()>& work);
    Row RowOf(QTreeWidgetItem* item) const;
    int Box(const std::u16string& text);
    // Runs a contact dialog until its fields pass the check against limits, or it is cancelled.
    bool RunContactDialog(ContactDialog& dialog, const StorageLimits& limits);
    // Says so and returns true while the SIM books are not ready.
    bool RefuseWhileReading();
    void LogPage(int page, const std::vector<Row>& rows);
    // Makes the row of entry index the current and only selected one of a SIM page.
    void SelectEntry(int page, int index);
    void NewContact(int page);
    void EditContact(int page);
    void CopyTo(int page, const std::string& target);
    void CopyRows(const std::vector<Row>& rows, const std::string& target);
    void DeleteContacts(int page);
    void Refresh(int page);
    void ImportVCard(int page);
    void ExportVCard(int page);
    MessageLayer& Messages();
    CacheNotify Notifier();
    CacheErrorBox ErrorBox();

    ShellContext& context_;
    std::unique_ptr<PhonebookCaches> ownCaches_;
    PhonebookCaches* caches_;
    std::unique_ptr<MessageLayer> ownMessages_;
    DialFunction dial_;
    WriteMessageFunction writeMessage_;
    AddressBookReader readAddressBook_;
    std::function<int()> cardState_;
    std::function<std::string(bool)> vcardPath_;
    ContactsLoadState state_;
    bool learningGeometry_ = false;
    QLineEdit* findEdit_ = nullptr;
    QPushButton* findButton_ = nullptr;
    ViewSet pages_;
    ViewSet outlookPages_;
    std::array<QTreeWidget*, kContactsPageCount> lists_{};
    std::array<QMenu*, kContactsPageCount> menus_{};
    QTreeWidgetItem* lastHit_ = nullptr;
    int lastHitPage_ = -1;
    std::mutex boxMutex_;
    std::u16string boxText_;
};

}  // namespace vqm
