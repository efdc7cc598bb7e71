#include "contacts/manage_contacts_view.h"

#include <QDialogButtonBox>
#include <QFileDialog>
#include <QFormLayout>
#include <QHeaderView>
#include <QLabel>
#include <QLineEdit>
#include <QMenu>
#include <QMetaObject>
#include <QPushButton>
#include <QResizeEvent>
#include <QTabBar>
#include <QTreeWidget>
#include <QVBoxLayout>
#include <algorithm>
#include <cstdio>
#include <cstring>
#include <fstream>
#include <sstream>
#include <vector>

#include "contacts/contact_pages_view.h"
#include "contacts/phonebook_at.h"
#include "link/link.h"
#include "shell/dialogs.h"
#include "shell/messages.h"
#include "shell/ui_log.h"
#include "support/numbers.h"
#include "support/settings_store.h"
#include "support/text.h"

namespace vqm {

namespace {

constexpr unsigned kMbIconStop = 0x10;
// The builder's one message to a person, moved to the view's thread.
constexpr unsigned kMsgShowAddressBookBox = 0x8101;
constexpr int kFindRowHeight = 20;

bool IsSimPage(int page) {
    return page == kContactsSimPage || page == kContactsCardPage;
}
const char* StorageOfPage(int page) {
    return page == kContactsSimPage ? "SM" : "ME";
}
int FileOfStorage(const std::string& code) {
    return code == "SM" ? 1 : 2;
}
int PageOfStorage(const std::string& code) {
    return code == "SM" ? kContactsSimPage : kContactsCardPage;
}

QString Q(const std::u16string& text) {
    return QString::fromStdU16String(text);
}
std::u16string U(const QString& text) {
    return text.toStdU16String();
}

std::u16string Wide(const char* narrow, int length, int size) {
    char16_t wide[kOutlookNameSize + 1];
    NarrowToWide(narrow, wide, std::clamp(length, 0, size), kOutlookNameSize + 1);
    return wide;
}

// A phonebook entry from a contact's texts as the card stores them.
PhonebookEntry MakeEntry(int index, const std::u16string& name, const std::u16string& number) {
    PhonebookEntry entry;
    std::memset(&entry, 0, sizeof entry);
    entry.index = index;
    entry.type = NumberType(number);
    entry.numberLength = WideToNarrow(number.c_str(), entry.number, static_cast<int>(number.size()),
                                      sizeof entry.number);
    entry.textLength =
        WideToNarrow(name.c_str(), entry.text, static_cast<int>(name.size()), sizeof entry.text);
    return entry;
}

}  // namespace

// ContactDialog

ContactDialog::ContactDialog(QWidget* parent, const QString& title, const QString& reason,
                             const QString& oldName, const QString& oldNumber)
    : QDialog(parent) {
    const bool copy = !reason.isEmpty();
    setObjectName(copy ? "COPY_CONTACTS_DIALOG" : "NEW_CONTACTS_DIALOG");
    setWindowTitle(title);
    auto* layout = new QVBoxLayout(this);
    auto* form = new QFormLayout();
    if (copy) {
        auto* why = new QLabel(reason, this);
        why->setTextFormat(Qt::PlainText);
        why->setWordWrap(true);
        SetControlId(why, kContactReasonId);
        layout->addWidget(why);
        auto* name = new QLabel(oldName, this);
        auto* number = new QLabel(oldNumber, this);
        name->setTextFormat(Qt::PlainText);  // names and numbers come from the card
        number->setTextFormat(Qt::PlainText);
        SetControlId(name, kContactOldNameId);
        SetControlId(number, kContactOldNumberId);
        form->addRow("Name:", name);
        form->addRow("Number:", number);
    }
    name_ = new QLineEdit(this);
    number_ = new QLineEdit(this);
    SetControlId(name_, kContactNameEditId);
    SetControlId(number_, kContactNumberEditId);
    // The checks read 32 characters of each; no more can be typed.
    name_->setMaxLength(32);
    number_->setMaxLength(32);
    form->addRow(copy ? "New Name:" : "Name:", name_);
    form->addRow(copy ? "New Number:" : "Number:", number_);
    layout->addLayout(form);
    layout->addStretch();
    auto* buttons = new QDialogButtonBox(QDialogButtonBox::Ok | QDialogButtonBox::Cancel, this);
    QObject::connect(buttons, &QDialogButtonBox::accepted, this, &ContactDialog::accept);
    QObject::connect(buttons, &QDialogButtonBox::rejected, this, [this] { done(2); });
    layout->addWidget(buttons);
}

void ContactDialog::accept() {
    if (!check || check()) done(1);
}

// ManageContactsView

ManageContactsView::ManageContactsView(QWidget* parent, ShellContext& context,
                                       PhonebookCaches* caches, DialFunction dial,
                                       WriteMessageFunction writeMessage)
    : View(parent),
      context_(context),
      dial_(std::move(dial)),
      writeMessage_(std::move(writeMessage)) {
    if (!caches) ownCaches_ = std::make_unique<PhonebookCaches>(context.settings);
    caches_ = caches ? caches : ownCaches_.get();
    cardState_ = [&context] {
        return context.mainWindow ? context.mainWindow->App().cardState : 0;
    };
    readAddressBook_ = [&settings = context.settings] { return ReadDesktopAddressBook(settings); };

    if (parent)
        resize(parent->width(), parent->height() - kMenuBarHeight);
    else
        resize(240, 320 - kMenuBarHeight);

    findEdit_ = new QLineEdit(this);
    SetControlId(findEdit_, kContactsFindEditId);
    findButton_ = new QPushButton("Find", this);
    SetControlId(findButton_, kContactsFindButtonId);
    QObject::connect(findButton_, &QPushButton::clicked, this, [this] { Find(); });
    QObject::connect(findEdit_, &QLineEdit::returnPressed, this, [this] { Find(); });

    CreateContactPages(this, "MANAGECONTACTS", kContactsTabId, kContactsOutlookTabId, pages_,
                       outlookPages_,
                       [this](QWidget* page, int n) { lists_[n] = MakeList(page, n); });
    Relayout();
    Messages();  // made on the view's thread, which owns it
}

ManageContactsView::~ManageContactsView() {
    // Reports still on their way are refused from here on, so no builder waits for a view
    // that is going; then every builder is joined.
    Messages().Close();
    caches_->workers.JoinAll();
}

void ManageContactsView::WaitForBuilders() {
    MessageLayer& messages = Messages();
    caches_->workers.JoinAll(
        [&messages](const std::function<bool()>& done) { messages.WaitWhileDelivering(done); });
}

// The builders report through a layer of the view's own: it lives exactly as long as the view,
// so a builder that ends while the program closes never sends into a window already gone.
MessageLayer& ManageContactsView::Messages() {
    if (!ownMessages_)
        ownMessages_ = std::make_unique<MessageLayer>([this] {
            QMetaObject::invokeMethod(
                this, [this] { ownMessages_->DeliverPending(); }, Qt::QueuedConnection);
        });
    return *ownMessages_;
}

CacheNotify ManageContactsView::Notifier() {
    MessageLayer* messages = &Messages();
    return [this, messages](unsigned msg) { messages->Send(this, msg, 0, 0); };
}

CacheErrorBox ManageContactsView::ErrorBox() {
    MessageLayer* messages = &Messages();
    return [this, messages](const std::u16string& text) {
        {
            std::lock_guard<std::mutex> lock(boxMutex_);
            boxText_ = text;
        }
        messages->Send(this, kMsgShowAddressBookBox, 0, 0);
    };
}

QTreeWidget* ManageContactsView::MakeList(QWidget* page, int index) {
    auto* list = new QTreeWidget(page);
    list->setObjectName("SysListView32");
    SetControlId(list, kContactsListFirstId + index);
    list->setColumnCount(4);
    list->setHeaderLabels({"Name", "Phone", "", ""});
    list->setColumnWidth(kContactsColumnName, 115);
    list->setColumnWidth(kContactsColumnPhone, 115);
    // The storage code and the index ride along with each row for the commands, unseen.
    list->header()->setMinimumSectionSize(0);
    for (int column : {kContactsColumnStorage, kContactsColumnIndex}) {
        list->setColumnWidth(column, 0);
        list->setColumnHidden(column, true);
    }
    list->setRootIsDecorated(false);
    list->setUniformRowHeights(true);
    list->setSelectionMode(QAbstractItemView::ExtendedSelection);
    list->header()->setStretchLastSection(false);
    QPalette palette = list->palette();
    palette.setColor(QPalette::Inactive, QPalette::Highlight,
                     palette.color(QPalette::Active, QPalette::Highlight));
    palette.setColor(QPalette::Inactive, QPalette::HighlightedText,
                     palette.color(QPalette::Active, QPalette::HighlightedText));
    list->setPalette(palette);
    auto* layout = new QVBoxLayout(page);
    layout->setContentsMargins(0, 0, 0, 0);
    layout->addWidget(list);

    auto* menu = new QMenu(list);
    auto add = [this, menu](const char* text, int id) {
        QAction* action = menu->addAction(text, this, [this, id] { Command(id); });
        action->setData(id);
    };
    add("New...", kCmdContactNew);
    add("Edit...", kCmdContactEdit);
    add("Make Call", kCmdContactCall);
    add("Write Message", kCmdContactMessage);
    if (index != kContactsSimPage) add("Copy To SIM Card", kCmdContactCopyToSim);
    if (index != kContactsCardPage) add("Copy To Card Phone", kCmdContactCopyToCard);
    add("Delete", kCmdContactDelete);
    add("Refresh", kCmdContactRefresh);
    if (IsSimPage(index)) {
        menu->addSeparator();
        add("Import vCard File...", kCmdContactImport);
        add("Export vCard File...", kCmdContactExport);
    }
    menus_[index] = menu;
    list->setContextMenuPolicy(Qt::CustomContextMenu);
    QObject::connect(list, &QWidget::customContextMenuRequested, this, [this, index](QPoint pos) {
        PrepareMenu(index, pos)->popup(List(index)->viewport()->mapToGlobal(pos));
    });
    // The remembered Find hit is forgotten once the user's selection moves.
    QObject::connect(list, &QTreeWidget::currentItemChanged, this,
                     [this](QTreeWidgetItem* current) {
                         if (current != lastHit_) lastHit_ = nullptr;
                     });
    return list;
}

QTreeWidget* ManageContactsView::List(int page) const {
    return page >= 0 && page < kContactsPageCount ? lists_[page] : nullptr;
}

int ManageContactsView::CurrentPage() const {
    if (pages_.current < 2) return pages_.current;
    return kContactsMobilePage + outlookPages_.current;
}

void ManageContactsView::ShowPage(int page) {
    auto* tabs = qobject_cast<QTabBar*>(FindControl(this, kContactsTabId));
    if (!tabs) return;
    tabs->setCurrentIndex(std::min(page, 2));
    if (page >= kContactsMobilePage) {
        if (auto* inner = qobject_cast<QTabBar*>(FindControl(this, kContactsOutlookTabId)))
            inner->setCurrentIndex(page - kContactsMobilePage);
    }
}

void ManageContactsView::Relayout() {
    const int w = width(), h = height();
    // Inset 4 on every side and moved down 2; the pages start 22 below the Find row.
    const int left = 4, top = 6, inner = std::max(0, w - 8);
    findEdit_->setGeometry(left, top, std::max(0, inner - 60), kFindRowHeight);
    findButton_->setGeometry(left + inner - 53, top, 53, kFindRowHeight);
    const int pagesTop = top + 22;
    const int pagesHeight = std::max(0, h - pagesTop - 4 - kMenuBarHeight);
    if (auto* tabs = qobject_cast<QTabBar*>(FindControl(this, kContactsTabId)))
        tabs->setGeometry(left, pagesTop + pagesHeight, inner, kMenuBarHeight);
    for (ViewRecord& record : pages_.records) {
        record.rect = QRect(left, pagesTop, inner, pagesHeight);
        if (record.window) record.window->setGeometry(record.rect);
    }
    if (View* outlook = pages_.records.size() > 2 ? pages_.records[2].window : nullptr) {
        const int innerHeight = std::max(0, pagesHeight - kMenuBarHeight);
        if (auto* tabs = qobject_cast<QTabBar*>(FindControl(outlook, kContactsOutlookTabId)))
            tabs->setGeometry(0, innerHeight, inner, kMenuBarHeight);
        for (ViewRecord& record : outlookPages_.records) {
            record.rect = QRect(0, 0, inner, innerHeight);
            if (record.window) record.window->setGeometry(record.rect);
        }
    }
}

void ManageContactsView::resizeEvent(QResizeEvent* event) {
    View::resizeEvent(event);
    Relayout();
}

long ManageContactsView::OnMessage(unsigned msg, long wParam, long) {
    switch (msg) {
        case kWmCommand:
            // A menu command from outside (a script driving the dialer through its socket),
            // as the page's own menu would give it.
            Command(static_cast<int>(wParam & 0xFFFF));
            break;
        case kMsgViewShown:
            Do(ContactsActivated(state_, cardState_()));
            break;
        case kMsgCardStateChanged: {
            const bool current =
                context_.mainWindow && context_.mainWindow->Views().current == kViewManageContacts;
            int32_t refreshSim = 0, refreshOutlook = 0;
            GetSettingInt(context_.settings, u"GeneralRefreshSim", &refreshSim);
            GetSettingInt(context_.settings, u"GeneralRefreshOutlook", &refreshOutlook);
            Do(ContactsCardStateChanged(state_, cardState_(), current, refreshSim, refreshOutlook));
            break;
        }
        case kMsgOutlookCacheBuilt:
            Do(ContactsOutlookDone(state_, cardState_()));
            break;
        case kMsgSimCacheBuilt:
            Do(ContactsSimDone(state_));
            break;
        case kMsgShowAddressBookBox: {
            std::u16string text;
            {
                std::lock_guard<std::mutex> lock(boxMutex_);
                text.swap(boxText_);
            }
            if (!text.empty()) Box(text);
            break;
        }
        default:
            break;
    }
    return 0;
}

void ManageContactsView::Do(unsigned work) {
    if (work & kWorkEmptySimLists) {
        EmptyList(kContactsSimPage);
        EmptyList(kContactsCardPage);
    }
    if (work & kWorkOutlookRebuild)
        OutlookCacheRebuild(*caches_, readAddressBook_, ErrorBox(), Notifier());
    if (work & kWorkOutlookClear) OutlookCacheClear(*caches_, Notifier());
    if (work & kWorkSimRebuild) SimCacheRebuild(*caches_, context_.link, Notifier());
    if (work & kWorkSimLoad) SimCacheLoad(*caches_, context_.link, Notifier());
    if (work & kWorkForwardOutlook)
        for (int page = kContactsMobilePage; page <= kContactsWorkPage; ++page)
            LoadPage(page);
    if (work & kWorkForwardSim) {
        LoadPage(kContactsSimPage);
        LoadPage(kContactsCardPage);
    }
    if (work & kWorkLearnGeometry) LearnGeometry();
}

int ManageContactsView::OnCard(const std::function<int()>& work) {
    return context_.mainWindow ? context_.mainWindow->RunAside(work) : work();
}

void ManageContactsView::LearnGeometry() {
    // The card is asked aside while the window goes on taking commands: none that needs the
    // limits (New, Copy To, Import) may start before they are known.
    learningGeometry_ = true;
    const struct {
        int storage;
        const char* prefix;
    } books[2] = {{kStorageCardPhone, "me"}, {kStorageSimCard, "sm"}};
    for (const auto& book : books) {
        int32_t number = 0, text = 0, total = 0;
        const int selected = OnCard([&] {
            if (PhonebookSelect(context_.link, book.storage) != 0) return 0;
            PhonebookGetGeometry(context_.link, &number, &text, &total);
            return 1;
        });
        if (selected) PhonebookSaveGeometry(context_.settings, book.prefix, number, text, total);
    }
    learningGeometry_ = false;
}

void ManageContactsView::EmptyList(int page) {
    if (QTreeWidget* list = List(page)) list->clear();
    if (lastHitPage_ == page) lastHit_ = nullptr;
}

void ManageContactsView::LoadPage(int page) {
    QTreeWidget* list = List(page);
    if (!list) return;
    EmptyList(page);
    const bool sim = IsSimPage(page);
    CacheGroup& group = sim ? caches_->sim : caches_->outlook;
    const int file = sim ? page + 1 : page - kContactsMobilePage + 1;
    const size_t size = CacheRecordSize(group, file);
    std::vector<Row> rows;
    FILE* stream = CacheOpen(group, file, kCacheRead);
    if (stream) {
        unsigned char record[kOutlookNumbersRecordSize];
        while (std::fread(record, 1, size, stream) == size) {
            Row row;
            if (sim) {
                PhonebookEntry entry;
                std::memcpy(&entry, record, sizeof entry);
                row.name = Wide(entry.text, entry.textLength, kPhonebookTextSize);
                row.number = Wide(entry.number, entry.numberLength, kPhonebookNumberSize);
                row.storage = page == kContactsSimPage ? u"SM" : u"ME";
                row.index = entry.index;
            } else {
                const char* name = reinterpret_cast<const char*>(record);
                const char* number = name + kOutlookNameSize;
                // Only the first number of a home or work record is listed.
                const int length = static_cast<int>(strnlen(number, kOutlookNumberSize));
                if (length == 0) continue;
                char16_t wide[kOutlookNameSize + 1];
                NarrowToWideZ(name, kOutlookNameSize, wide, kOutlookNameSize + 1);
                row.name = wide;
                row.number = Wide(number, length, kOutlookNumberSize);
            }
            rows.push_back(std::move(row));
        }
    }
    CacheClose(group, stream);
    std::stable_sort(rows.begin(), rows.end(), [](const Row& a, const Row& b) {
        const std::string an = Utf16ToUtf8(a.name), bn = Utf16ToUtf8(b.name);
        return CompareText(0, an.c_str(), static_cast<int>(an.size()), bn.c_str(),
                           static_cast<int>(bn.size())) < 0;
    });
    for (const Row& row : rows) {
        auto* item = new QTreeWidgetItem(list);
        item->setText(kContactsColumnName, Q(row.name));
        item->setText(kContactsColumnPhone, Q(row.number));
        item->setText(kContactsColumnStorage, Q(row.storage));
        if (row.index > 0) item->setText(kContactsColumnIndex, QString::number(row.index));
    }
    LogPage(page, rows);
}

// What a page lists, into the ui log: a line with the count, then one per row as shown.
void ManageContactsView::LogPage(int page, const std::vector<Row>& rows) {
    if (!context_.uiLog || !context_.uiLog->Enabled()) return;
    const std::u16string title = ContactPageTitle(page);
    context_.uiLog->Line("contacts-list",
                         title + u": " + Utf8ToUtf16(std::to_string(rows.size())) + u" rows");
    for (const Row& row : rows) {
        std::u16string line = title + u": " + row.name + u" <" + row.number + u">";
        if (row.index > 0)
            line += u" " + row.storage + u" " + Utf8ToUtf16(std::to_string(row.index));
        context_.uiLog->Line("contacts-row", line);
    }
}

void ManageContactsView::SelectEntry(int page, int index) {
    QTreeWidget* list = List(page);
    if (!list) return;
    const QString wanted = QString::number(index);
    for (int i = 0; i < list->topLevelItemCount(); ++i) {
        QTreeWidgetItem* item = list->topLevelItem(i);
        if (item->text(kContactsColumnIndex) != wanted) continue;
        list->clearSelection();
        list->setCurrentItem(item);
        item->setSelected(true);
        list->scrollToItem(item);
        return;
    }
}

std::vector<QTreeWidgetItem*> ManageContactsView::ChosenRows(int page) const {
    std::vector<QTreeWidgetItem*> rows;
    QTreeWidget* list = List(page);
    if (!list) return rows;
    for (int i = 0; i < list->topLevelItemCount(); ++i) {
        QTreeWidgetItem* item = list->topLevelItem(i);
        // Selected or focused, in list order.
        if (item->isSelected() || item == list->currentItem()) rows.push_back(item);
    }
    return rows;
}

ManageContactsView::Row ManageContactsView::RowOf(QTreeWidgetItem* item) const {
    Row row;
    row.name = U(item->text(kContactsColumnName).left(128));
    row.number = U(item->text(kContactsColumnPhone).left(32));
    row.storage = U(item->text(kContactsColumnStorage).left(4));
    row.index = item->text(kContactsColumnIndex).left(16).toInt();
    return row;
}

bool ManageContactsView::SimBooksReady() const {
    return state_.sim == 2 && !learningGeometry_ && !SimCacheBuilding(*caches_);
}

bool ManageContactsView::RefuseWhileReading() {
    if (SimBooksReady()) return false;
    // The free place comes from the cache: while it is missing or half written, the first
    // place would be taken and the card's own entry there overwritten.
    Box(kContactsStillReadingText);
    return true;
}

std::vector<FileMenuEntry> ManageContactsView::FileMenuEntries() {
    const bool simPage = IsSimPage(CurrentPage());
    return {{u"Import vCard File...", kCmdContactImport,
             simPage && cardState_() == 2 && SimBooksReady()},
            {u"Export vCard File...", kCmdContactExport, simPage}};
}

QMenu* ManageContactsView::PrepareMenu(int page, QPoint pos) {
    QTreeWidget* list = List(page);
    QMenu* menu = menus_[page];
    QTreeWidgetItem* tapped = list->itemAt(pos);
    if (tapped && list->selectedItems().size() < 2) {
        list->clearSelection();
        list->setCurrentItem(tapped);
        tapped->setSelected(true);
    }
    const bool onRow = tapped != nullptr || !list->selectedItems().isEmpty();
    const bool connected = cardState_() == 2;
    const bool ready = SimBooksReady();  // the commands that take a free place
    for (QAction* action : menu->actions()) {
        bool enabled = true;
        switch (action->data().toInt()) {
            case kCmdContactNew:
                enabled = connected && ready && IsSimPage(page);
                break;
            case kCmdContactEdit:
                enabled = connected && IsSimPage(page) && onRow;
                break;
            case kCmdContactDelete:
                // The address book is only read here: its own program edits it.
                enabled = connected && IsSimPage(page) && onRow;
                break;
            case kCmdContactCall:
            case kCmdContactMessage:
                enabled = onRow;
                break;
            case kCmdContactCopyToSim:
            case kCmdContactCopyToCard:
                enabled = connected && ready && onRow;
                break;
            case kCmdContactImport:
                enabled = connected && ready;
                break;
            case kCmdContactRefresh:
                enabled = connected;
                break;
            default:
                break;
        }
        action->setEnabled(enabled);
    }
    return menu;
}

void ManageContactsView::Command(int id) {
    const int page = CurrentPage();
    QTreeWidget* list = List(page);
    switch (id) {
        case kCmdContactNew:
            if (IsSimPage(page)) NewContact(page);
            break;
        case kCmdContactEdit:
            if (IsSimPage(page)) EditContact(page);
            break;
        case kCmdContactCall: {
            QTreeWidgetItem* item = list ? list->currentItem() : nullptr;
            if (item && dial_) dial_(RowOf(item).number);
            break;
        }
        case kCmdContactMessage: {
            QTreeWidgetItem* item = list ? list->currentItem() : nullptr;
            if (!item || !writeMessage_) break;
            const Row row = RowOf(item);
            writeMessage_(RecipientText(row.name, row.number));
            break;
        }
        case kCmdContactCopyToSim:
            CopyTo(page, "SM");
            break;
        case kCmdContactCopyToCard:
            CopyTo(page, "ME");
            break;
        case kCmdContactDelete:
            if (IsSimPage(page)) DeleteContacts(page);
            break;
        case kCmdContactRefresh:
            Refresh(page);
            break;
        case kCmdContactImport:
            if (IsSimPage(page)) ImportVCard(page);
            break;
        case kCmdContactExport:
            if (IsSimPage(page)) ExportVCard(page);
            break;
        default:
            break;
    }
}

int ManageContactsView::Box(const std::u16string& text) {
    return context_.dialogs.MessageBox(this, text, u"Error", kMbIconStop | kMbTopmost);
}

bool ManageContactsView::RunContactDialog(ContactDialog& dialog, const StorageLimits& limits) {
    auto verdict = [&dialog, &limits] {
        return CheckContact(U(dialog.Name()->text()), U(dialog.Number()->text()), limits.textLength,
                            limits.numberLength);
    };
    bool checkedByOk = false;
    dialog.check = [&] {
        const ContactCheckResult result = verdict();
        if (result.check == ContactCheck::Refused) Box(result.message);
        checkedByOk = result.check == ContactCheck::Ok;
        return checkedByOk;
    };
    std::u16string lastName, lastNumber;
    for (bool first = true;; first = false) {
        checkedByOk = false;
        if (context_.dialogs.Run(&dialog) != kIdOk) return false;
        if (checkedByOk) return true;
        // Answered without the OK button (a script or a test): the same check, then again,
        // unless the answer changed nothing since the last refusal.
        const ContactCheckResult result = verdict();
        if (result.check == ContactCheck::Ok) return true;
        if (result.check == ContactCheck::Refused) Box(result.message);
        const std::u16string name = U(dialog.Name()->text()), number = U(dialog.Number()->text());
        if (!first && name == lastName && number == lastNumber) return false;
        lastName = name;
        lastNumber = number;
    }
}

void ManageContactsView::NewContact(int page) {
    if (RefuseWhileReading()) return;
    const std::string code = StorageOfPage(page);
    const StorageLimits limits = ReadStorageLimits(context_.settings, code);
    const int index = SimCacheNextFreeIndex(caches_->sim, FileOfStorage(code));
    if (limits.total > 0 && index > limits.total) {
        Box(u"The phonebook memory is full.");
        return;
    }
    ContactDialog dialog(this, "New Contacts");
    if (!RunContactDialog(dialog, limits)) return;
    const PhonebookEntry entry =
        MakeEntry(index, U(dialog.Name()->text()), U(dialog.Number()->text()));
    if (OnCard([&] { return PhonebookWriteEntry(context_.link, code.c_str(), entry); }) != 0) {
        Box(u"Cannot write phonebook entry.");
        return;
    }
    SimCacheAppend(caches_->sim, FileOfStorage(code), entry);
    LoadPage(page);
    SelectEntry(page, entry.index);  // the new contact, where the sort put it
}

void ManageContactsView::EditContact(int page) {
    QTreeWidget* list = List(page);
    QTreeWidgetItem* item = list ? list->currentItem() : nullptr;
    if (!item) return;
    const Row row = RowOf(item);
    const std::string code = row.storage == u"SM" ? "SM" : "ME";
    const StorageLimits limits = ReadStorageLimits(context_.settings, code);
    ContactDialog dialog(this, "Edit Contacts");
    dialog.Name()->setText(Q(row.name));
    dialog.Number()->setText(Q(row.number));
    if (!RunContactDialog(dialog, limits)) return;
    const PhonebookEntry entry =
        MakeEntry(row.index, U(dialog.Name()->text()), U(dialog.Number()->text()));
    if (OnCard([&] { return PhonebookWriteEntry(context_.link, code.c_str(), entry); }) != 0) {
        Box(u"Cannot write phonebook entry.");
        return;
    }
    SimCacheReplace(caches_->sim, FileOfStorage(code), entry);
    LoadPage(page);
    SelectEntry(page, entry.index);  // still the contact just edited
}

void ManageContactsView::CopyTo(int page, const std::string& target) {
    if (RefuseWhileReading()) return;
    std::vector<Row> rows;
    for (QTreeWidgetItem* item : ChosenRows(page))
        rows.push_back(RowOf(item));
    CopyRows(rows, target);
}

void ManageContactsView::CopyRows(const std::vector<Row>& rows, const std::string& target) {
    const StorageLimits limits = ReadStorageLimits(context_.settings, target);
    const int file = FileOfStorage(target);
    for (const Row& row : rows) {
        const int index = SimCacheNextFreeIndex(caches_->sim, file);
        if (limits.total > 0 && index > limits.total) {
            Box(u"The phonebook memory is full.");
            break;
        }
        std::u16string name = row.name.substr(0, 32), number = row.number.substr(0, 32);
        const bool english = IsEnglishText(name.c_str(), name.size() * 2) != 0;
        const bool tooLong = static_cast<int64_t>(name.size()) > limits.textLength ||
                             static_cast<int64_t>(number.size()) > limits.numberLength;
        if (!english || tooLong) {
            const char16_t* reason =
                !english ? u"Contact name cannot have non-English characters."
                         : u"Due to SIM Card and Card Phone memory limitation, the contact name "
                           u"and number will be truncated.";
            ContactDialog dialog(this, "Copy Contacts", Q(reason), Q(name), Q(number));
            dialog.Name()->setText(Q(name.substr(0, std::max(0, limits.textLength))));
            dialog.Number()->setText(Q(number.substr(0, std::max(0, limits.numberLength))));
            if (!RunContactDialog(dialog, limits)) break;
            name = U(dialog.Name()->text());
            number = U(dialog.Number()->text());
        }
        const PhonebookEntry entry = MakeEntry(index, name, number);
        if (OnCard([&] { return PhonebookWriteEntry(context_.link, target.c_str(), entry); }) !=
            0) {
            Box(u"Cannot write phonebook entry.");
            break;
        }
        SimCacheAppend(caches_->sim, file, entry);
    }
    LoadPage(PageOfStorage(target));
}

void ManageContactsView::DeleteContacts(int page) {
    // The rows are read first: the list may be filled again while the card works.
    std::vector<Row> rows;
    for (QTreeWidgetItem* item : ChosenRows(page))
        rows.push_back(RowOf(item));
    std::string last;
    for (const Row& row : rows) {
        const std::string code = Utf16ToUtf8(row.storage);
        if (!OnCard([&] { return PhonebookDeleteEntry(context_.link, code.c_str(), row.index); })) {
            Box(u"Cannot delete phonebook entry.");
            break;
        }
        SimCacheRemove(caches_->sim, FileOfStorage(code), row.index);
        last = code;
    }
    if (!last.empty()) LoadPage(PageOfStorage(last));
}

void ManageContactsView::Refresh(int page) {
    if (IsSimPage(page)) {
        state_.sim = 1;
        SimCacheRebuild(*caches_, context_.link, Notifier());
    } else {
        state_.outlook = 1;
        OutlookCacheRebuild(*caches_, readAddressBook_, ErrorBox(), Notifier());
    }
}

void ManageContactsView::ImportVCard(int page) {
    if (RefuseWhileReading()) return;
    std::string path;
    if (vcardPath_) {
        path = vcardPath_(false);
    } else {
        path = QFileDialog::getOpenFileName(this, "Import vCard File", {},
                                            "vCard files (*.vcf);;All files (*)")
                   .toStdString();
    }
    if (path.empty()) return;
    std::ifstream in(path, std::ios::binary);
    std::ostringstream text;
    if (!in) {
        Box(u"Cannot read " + Utf8ToUtf16(path) + u".");
        return;
    }
    text << in.rdbuf();  // an empty file holds no cards
    const AddressBookResult cards = ParseVCards(text.str());
    if (!cards.opened) {
        Box(Utf8ToUtf16(cards.missingLibrary) + u" is missing.");
        return;
    }
    // Each card goes in as Copy To takes a row: checked, and offered for cutting short.
    std::vector<Row> rows;
    for (const VCardImportEntry& entry : VCardsToPhonebook(cards)) {
        char16_t digits[256];
        CopyNumberText(entry.number.c_str(), digits, 256);
        Row row;
        row.name = entry.name;
        row.number = digits;
        rows.push_back(std::move(row));
    }
    CopyRows(rows, StorageOfPage(page));
}

void ManageContactsView::ExportVCard(int page) {
    std::string path;
    if (vcardPath_) {
        path = vcardPath_(true);
    } else {
        path = QFileDialog::getSaveFileName(this, "Export vCard File", "contacts.vcf",
                                            "vCard files (*.vcf)")
                   .toStdString();
    }
    if (path.empty()) return;
    std::vector<PhonebookEntry> entries;
    const int file = page + 1;
    FILE* stream = CacheOpen(caches_->sim, file, kCacheRead);
    PhonebookEntry entry;
    while (stream && std::fread(&entry, 1, sizeof entry, stream) == sizeof entry)
        entries.push_back(entry);
    CacheClose(caches_->sim, stream);
    std::string missing;
    const std::string text = PhonebookToVCards(entries, &missing);
    if (!missing.empty()) {
        Box(Utf8ToUtf16(missing) + u" is missing.");
        return;
    }
    // Written beside the target and renamed over it, so a failed export never leaves half a file.
    const std::string temporary = path + ".tmp";
    std::ofstream out(temporary, std::ios::binary | std::ios::trunc);
    out << text;
    out.close();
    if (!out || std::rename(temporary.c_str(), path.c_str()) != 0) {
        std::remove(temporary.c_str());
        Box(u"Cannot write " + Utf8ToUtf16(path) + u".");
    }
}

void ManageContactsView::Find() {
    const int page = CurrentPage();
    QTreeWidget* list = List(page);
    const std::u16string search = U(findEdit_->text());
    if (!list || search.empty()) return;
    std::vector<std::u16string> names;
    int last = -1;
    for (int i = 0; i < list->topLevelItemCount(); ++i) {
        QTreeWidgetItem* item = list->topLevelItem(i);
        names.push_back(U(item->text(kContactsColumnName).left(128)));
        if (item == lastHit_ && lastHitPage_ == page) last = i;
    }
    const int hit = FindNext(names, search, last);
    if (hit < 0) return;
    QTreeWidgetItem* item = list->topLevelItem(hit);
    list->clearSelection();
    lastHit_ = item;  // set first: the selection change below is Find's own
    lastHitPage_ = page;
    list->setCurrentItem(item);
    item->setSelected(true);
    list->scrollToItem(item);
}

}  // namespace vqm
