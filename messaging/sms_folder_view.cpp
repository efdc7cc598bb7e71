#include "messaging/sms_folder_view.h"

#include <QHeaderView>
#include <QMetaObject>
#include <QPainter>
#include <QPushButton>
#include <QResizeEvent>
#include <QTabBar>
#include <QTextEdit>
#include <QTreeWidget>
#include <algorithm>
#include <atomic>
#include <cstdio>

#include "contacts/manage_contacts.h"
#include "link/link.h"
#include "shell/card_watch.h"
#include "shell/dialogs.h"
#include "shell/messages.h"
#include "shell/ui_log.h"
#include "support/settings_store.h"
#include "support/text.h"

namespace vqm {

namespace {

constexpr const char* kPageClasses[kPageCount] = {"SMSFOLDER_INBOX_PAGE", "SMSFOLDER_OUTBOX_PAGE",
                                                  "SMSFOLDER_SENT_PAGE", "SMSFOLDER_DRAFT_PAGE",
                                                  "SMSFOLDER_PDA_PAGE"};
constexpr size_t kNameSize = 140;
constexpr int kButtonHeight = 24;

// Image 1: a closed envelope with a blue mark, for a message not read yet.
QPixmap PaintUnreadImage() {
    QPixmap image(16, 16);
    image.fill(Qt::transparent);
    QPainter p(&image);
    p.setRenderHint(QPainter::Antialiasing);
    p.setPen(QPen(QColor(40, 40, 40), 1));
    p.setBrush(QColor(255, 244, 200));
    const QRectF envelope(1.5, 4.5, 12, 9);
    p.drawRect(envelope);
    p.drawLine(envelope.topLeft(), QPointF(envelope.center().x(), envelope.center().y() + 1));
    p.drawLine(envelope.topRight(), QPointF(envelope.center().x(), envelope.center().y() + 1));
    p.setPen(Qt::NoPen);
    p.setBrush(QColor(30, 110, 220));
    p.drawEllipse(QRectF(10, 1, 5, 5));
    return image;
}

QString Q(const std::u16string& text) {
    return QString::fromStdU16String(text);
}

}  // namespace

SmsFolderView::SmsFolderView(QWidget* parent, ShellContext& context, PhonebookCaches* caches,
                             FolderViewHooks hooks)
    : View(parent),
      context_(context),
      ownCaches_(caches ? nullptr : std::make_unique<PhonebookCaches>(context.settings)),
      caches_(caches ? caches : ownCaches_.get()),
      hooks_(std::move(hooks)),
      store_(context.settings),
      unreadImage_(PaintUnreadImage()) {
    cardState_ = [&context] {
        return context.mainWindow ? context.mainWindow->App().cardState : 0;
    };
    StoreGuardCreate(store_);
    store_.hooks.beginBusy = [this] { BeginBusy(); };
    store_.hooks.endBusy = [this] { EndBusy(); };
    store_.hooks.pasteInto = [this](int page) {
        if (pages_.current != page) SelectPage(page);
        Paste();
    };
    store_.hooks.selectFirstUnread = [this] { SelectFirstUnread(); };
    store_.hooks.simFullAlert = [this](int full) {
        if (hooks_.simFullAlert) hooks_.simFullAlert(full);
    };

    if (parent)
        resize(parent->width(), parent->height() - kMenuBarHeight);
    else
        resize(240, 320 - kMenuBarHeight);
    for (int page = 0; page < kPageCount; ++page) {
        ViewRecord record;
        record.caption = PageTitle(page);
        record.className = kPageClasses[page];
        record.windowProc = [this, page](QWidget* pageParent) {
            return MakePage(pageParent, page);
        };
        pages_.records.push_back(std::move(record));
    }
    CreateTabbedPages(this, kFolderTabId, pages_, QRect(0, 0, width(), height()));
    if (auto* tabs = qobject_cast<QTabBar*>(FindControl(this, kFolderTabId))) {
        // Five captions with their counts share the narrow strip: a smaller face fits them all.
        QFont font = tabs->font();
        font.setPointSizeF(font.pointSizeF() * 0.8);
        tabs->setFont(font);
        tabs->setUsesScrollButtons(false);
        tabs->setExpanding(true);
        tabs->setElideMode(Qt::ElideNone);
        tabs->setStyleSheet("QTabBar::tab { padding: 2px 1px; min-width: 0px; }");
    }
    Relayout();
    Reload();
}

SmsFolderView::~SmsFolderView() {
    JoinRefresh();
    StoreGuardDestroy(store_);
}

void SmsFolderView::JoinRefresh() {
    // The refresh may be sending us its end notice: deliver it while waiting, then join.
    if (!store_.refresh.joinable()) return;
    if (context_.messages && context_.messages->OnOwnerThread())
        context_.messages->WaitWhileDelivering([this] { return !store_.refreshRunning; });
    StoreJoinRefresh(store_);
}

View* SmsFolderView::MakePage(QWidget* parent, int page) {
    auto* view = new View(parent);
    auto* list = new QTreeWidget(view);
    list->setObjectName("ListView");
    SetControlId(list, kFolderListFirstId + page);
    list->setColumnCount(5);
    list->setHeaderLabels({"From", "Message", "Date & Time", "Memory", ""});
    list->header()->setMinimumSectionSize(0);
    list->setColumnWidth(kColumnFrom, 80);
    list->setColumnWidth(kColumnMessage, 110);
    list->setColumnWidth(kColumnDate, 125);
    list->setColumnWidth(kColumnMemory, 50);
    list->setColumnWidth(kColumnRow, 0);
    list->setColumnHidden(kColumnRow, true);
    list->setRootIsDecorated(false);
    list->setUniformRowHeights(true);
    list->setSelectionMode(QAbstractItemView::ExtendedSelection);
    list->setIconSize(QSize(16, 16));
    QPalette palette = list->palette();
    palette.setColor(QPalette::Inactive, QPalette::Highlight,
                     palette.color(QPalette::Active, QPalette::Highlight));
    palette.setColor(QPalette::Inactive, QPalette::HighlightedText,
                     palette.color(QPalette::Active, QPalette::HighlightedText));
    list->setPalette(palette);
    lists_[page] = list;

    auto* pane = new QTextEdit(view);
    pane->setReadOnly(true);
    SetControlId(pane, kFolderPaneFirstId + page);
    panes_[page] = pane;

    auto button = [&](const char* label, int id, auto action) {
        auto* b = new QPushButton(label, view);
        SetControlId(b, id);
        QObject::connect(b, &QPushButton::clicked, this, action);
        return b;
    };
    // The Outbox's messages wait to be sent: its first button sends instead of replying.
    replies_[page] = page == kPageOutbox
                         ? button("Send", kFolderReplyFirstId + page, [this] { SendSelected(); })
                         : button("Reply", kFolderReplyFirstId + page, [this] { Reply(); });
    forwards_[page] = button("Forward", kFolderForwardFirstId + page, [this] { Forward(); });
    deletes_[page] = button("Delete", kFolderDeleteFirstId + page, [this] { DeleteSelected(); });

    QObject::connect(list, &QTreeWidget::currentItemChanged, this,
                     [this, page] { ShowSelected(page); });
    return view;
}

void SmsFolderView::Relayout() {
    const int w = width();
    const int pageHeight = std::max(0, height() - kMenuBarHeight);
    if (auto* tabs = qobject_cast<QTabBar*>(FindControl(this, kFolderTabId)))
        tabs->setGeometry(0, pageHeight, w, kMenuBarHeight);
    for (int page = 0; page < static_cast<int>(pages_.records.size()); ++page) {
        ViewRecord& record = pages_.records[page];
        record.rect = QRect(0, 0, w, pageHeight);
        if (record.window) record.window->setGeometry(record.rect);
        if (!lists_[page]) continue;
        const int buttonsTop = pageHeight - kButtonHeight - 2;
        const int listHeight = std::max(0, (buttonsTop - 4) * 3 / 5);
        lists_[page]->setGeometry(0, 0, w, listHeight);
        panes_[page]->setGeometry(0, listHeight + 2, w, std::max(0, buttonsTop - listHeight - 4));
        const int bw = (w - 8) / 3;
        replies_[page]->setGeometry(2, buttonsTop, bw, kButtonHeight);
        forwards_[page]->setGeometry(4 + bw, buttonsTop, bw, kButtonHeight);
        deletes_[page]->setGeometry(6 + 2 * bw, buttonsTop, bw, kButtonHeight);
    }
}

void SmsFolderView::resizeEvent(QResizeEvent* event) {
    View::resizeEvent(event);
    Relayout();
}

QTreeWidget* SmsFolderView::List(int page) const {
    return page >= 0 && page < kPageCount ? lists_[page] : nullptr;
}

QTextEdit* SmsFolderView::Pane(int page) const {
    return page >= 0 && page < kPageCount ? panes_[page] : nullptr;
}

std::u16string SmsFolderView::NameOf(const char* number) {
    char16_t name[kNameSize] = {};
    if (!FindNameByNumber(*caches_, number, name, kNameSize)) return {};
    return name;
}

void SmsFolderView::Reload() {
    bool taken = false;
    FillFolderPages(
        store_, [this](const char* number) { return NameOf(number); }, [&taken] { taken = true; },
        &listing_);
    auto* tabs = qobject_cast<QTabBar*>(FindControl(this, kFolderTabId));
    selecting_ = true;
    for (int page = 0; page < kPageCount; ++page) {
        QTreeWidget* list = lists_[page];
        if (!list) continue;
        list->clear();
        panes_[page]->clear();
        const std::vector<FolderRow>& rows = listing_.pages[page];
        for (size_t i = 0; i < rows.size(); ++i) {
            const FolderRow& row = rows[i];
            auto* item = new QTreeWidgetItem(list);
            item->setText(kColumnFrom, Q(row.from));
            item->setText(kColumnMessage, Q(row.preview));
            item->setText(kColumnDate, Q(row.date));
            item->setText(kColumnMemory, Q(row.folder == kFolderSim ? kMemorySim : kMemoryPda));
            item->setText(kColumnRow, QString::number(i));
            if (row.unread) item->setIcon(kColumnFrom, unreadImage_);
        }
        if (tabs && page <= kPageSent)
            tabs->setTabText(page, Q(PageCaption(page, listing_.unread[page])));
    }
    selecting_ = false;
    if (context_.uiLog && context_.uiLog->Enabled()) {
        std::u16string line;
        for (int page = 0; page < kPageCount; ++page)
            line += (page ? u" " : u"") + std::u16string(PageTitle(page)) + u"=" +
                    Utf8ToUtf16(std::to_string(listing_.pages[page].size()));
        context_.uiLog->Line("sms-folder", line);
    }
    if (taken && hooks_.newMessagesTaken) hooks_.newMessagesTaken();
}

const FolderRow* SmsFolderView::CurrentRow(int page) const {
    QTreeWidget* list = List(page);
    if (!list) return nullptr;
    QTreeWidgetItem* item = list->currentItem();
    if (!item && !list->selectedItems().isEmpty()) item = list->selectedItems().front();
    if (!item) return nullptr;
    const size_t at = item->text(kColumnRow).toULong();
    return at < listing_.pages[page].size() ? &listing_.pages[page][at] : nullptr;
}

std::vector<FolderRow> SmsFolderView::SelectedRows(int page) const {
    std::vector<FolderRow> rows;
    QTreeWidget* list = List(page);
    if (!list) return rows;
    for (int i = 0; i < list->topLevelItemCount(); ++i) {
        QTreeWidgetItem* item = list->topLevelItem(i);
        if (!item->isSelected() && item != list->currentItem()) continue;
        const size_t at = item->text(kColumnRow).toULong();
        if (at < listing_.pages[page].size()) rows.push_back(listing_.pages[page][at]);
    }
    return rows;
}

void SmsFolderView::ShowSelected(int page) {
    const FolderRow* row = CurrentRow(page);
    QTextEdit* pane = Pane(page);
    if (!pane) return;
    if (!row) {
        pane->clear();
        return;
    }
    pane->setPlainText(Q(row->body));
    if (context_.uiLog && context_.uiLog->Enabled())
        context_.uiLog->Line("sms-shown", std::u16string(PageTitle(page)) + u": " + row->from +
                                              u" | " + row->preview +
                                              (row->unread ? u" | unread" : u""));
    // A message the program selected for the user stays unread until the user opens it.
    if (selecting_ || !row->unread) return;
    OpenMessage(store_, *row);
    FolderRow& opened =
        listing_.pages[page][static_cast<size_t>(row - listing_.pages[page].data())];
    opened.unread = false;
    if (QTreeWidgetItem* item = lists_[page]->currentItem()) item->setIcon(kColumnFrom, QIcon());
    if (listing_.unread[page] > 0) --listing_.unread[page];
    if (auto* tabs = qobject_cast<QTabBar*>(FindControl(this, kFolderTabId)))
        tabs->setTabText(page, Q(PageCaption(page, listing_.unread[page])));
}

bool SmsFolderView::SelectFirstUnread() {
    QTreeWidget* list = List(kPageInbox);
    if (!list) return false;
    for (int i = 0; i < list->topLevelItemCount(); ++i) {
        QTreeWidgetItem* item = list->topLevelItem(i);
        const size_t at = item->text(kColumnRow).toULong();
        if (at >= listing_.pages[kPageInbox].size() || !listing_.pages[kPageInbox][at].unread)
            continue;
        selecting_ = true;
        list->clearSelection();
        list->setCurrentItem(item);
        item->setSelected(true);
        list->setFocus();
        ShowSelected(kPageInbox);
        selecting_ = false;
        return true;
    }
    return false;
}

void SmsFolderView::SelectPage(int page) {
    if (page < 0 || page >= kPageCount) return;
    if (auto* tabs = qobject_cast<QTabBar*>(FindControl(this, kFolderTabId)))
        tabs->setCurrentIndex(page);  // the tab strip switches the page
    SwitchView(pages_, page);
}

namespace {
// A box asked for by work that runs aside: shown on the window's thread while the work waits.
constexpr unsigned kMsgFolderBox = 1325;
struct BoxRequest {
    std::u16string text, title;
};
}  // namespace

FolderUi SmsFolderView::Ui() {
    FolderUi ui;
    ui.box = [this](const std::u16string& text, const std::u16string& title) {
        BoxRequest request{text, title};
        if (context_.messages && !context_.messages->OnOwnerThread()) {
            context_.messages->Send(this, kMsgFolderBox, reinterpret_cast<long>(&request), 0);
            return;
        }
        ShowBox(request.text, request.title);
    };
    ui.beginBusy = [this] { BeginBusy(); };
    ui.endBusy = [this] { EndBusy(); };
    return ui;
}

void SmsFolderView::ShowBox(const std::u16string& text, const std::u16string& title) {
    const unsigned icon = title == u"VQM Dialer" ? kMbIconInformation : kMbIconExclamation;
    context_.dialogs.MessageBox(this, text, title, kMbOk | icon | kMbTopmost);
}

int SmsFolderView::OnCard(const std::function<int()>& work) {
    return context_.mainWindow ? context_.mainWindow->RunAside(work) : work();
}

void SmsFolderView::BeginBusy() {
    if (context_.mainWindow) context_.mainWindow->Busy().BeginBusy();
}

void SmsFolderView::EndBusy() {
    if (context_.mainWindow) context_.mainWindow->Busy().EndBusy();
}

void SmsFolderView::Paste() {
    const FolderUi ui = Ui();
    const int page = pages_.current;
    OnCard([&] { return PasteIntoPage(store_, context_.link, page, ui); });
    Reload();
}

void SmsFolderView::Reply() {
    const FolderRow* row = CurrentRow(pages_.current);
    if (!row || !row->record.number[0]) return;
    char16_t number[32];
    NarrowToWide(row->record.number, number,
                 static_cast<int>(strnlen(row->record.number, sizeof row->record.number)), 32);
    if (hooks_.write) hooks_.write(ReplyRequest(RecipientText(NameOf(row->record.number), number)));
}

void SmsFolderView::Forward() {
    const FolderRow* row = CurrentRow(pages_.current);
    if (!row) return;
    if (hooks_.write) hooks_.write(ForwardRequest(row->body));
}

void SmsFolderView::DeleteSelected() {
    const std::vector<FolderRow> rows = SelectedRows(pages_.current);
    if (rows.empty()) return;
    const FolderUi ui = Ui();
    std::atomic<bool> simFullCleared{false};
    OnCard([&] {
        return DeleteMessages(store_, context_.link, rows, ui, [&] { simFullCleared = true; });
    });
    // The DialPad's notice is the window's: cleared here, once the card has room again.
    if (simFullCleared && hooks_.simFullAlert) hooks_.simFullAlert(0);
    Reload();
}

void SmsFolderView::SendSelected() {
    const FolderRow* row = CurrentRow(pages_.current);
    if (!row) return;
    const FolderRow chosen = *row;
    const FolderUi ui = Ui();
    OnCard([&] { return SendStoredMessage(store_, context_.link, chosen, ui); });
    Reload();
}

void SmsFolderView::EnableSimButtons(bool enable) {
    for (int page = 0; page < kPageCount; ++page) {
        if (replies_[page]) replies_[page]->setEnabled(enable);
        if (forwards_[page]) forwards_[page]->setEnabled(enable);
    }
}

void SmsFolderView::StartRefresh() {
    BeginBusy();
    refreshState_ = kFolderRefreshing;
    StoreStartSimRefresh(store_, context_.link, [this] {
        if (context_.messages) {
            context_.messages->Send(this, kMsgSimRefreshDone, 0, 0);
            return;
        }
        QMetaObject::invokeMethod(
            this, [this] { OnMessage(kMsgSimRefreshDone, 0, 0); }, Qt::QueuedConnection);
    });
}

void SmsFolderView::OnRefreshDone() {
    // The refresh thread is still in its send of this notice: the next start joins it.
    if (refreshState_ != kFolderRefreshing) return;
    EndBusy();
    refreshState_ = kFolderRefreshed;
    ImportPcMessages(store_);
    Reload();
    if (pages_.current != kPageInbox) SelectPage(kPageInbox);
    SelectFirstUnread();
}

void SmsFolderView::OnCardState() {
    if (cardState_() == 1) {
        refreshState_ = kFolderNotRefreshed;
        for (auto& page : listing_.pages)
            page.clear();
        for (QTreeWidget* list : lists_)
            if (list) list->clear();
        EnableSimButtons(false);
        JoinRefresh();
        std::remove(StoreFolderPath(store_, kFolderSim).c_str());
        return;
    }
    if (cardState_() != 2) return;
    EnableSimButtons(true);
    if (isVisible()) {
        OnMessage(kMsgViewShown, 0, 0);
    } else if (IndexListCount(context_.settings, kNewIdx) > 0) {
        if (context_.mainWindow) context_.mainWindow->Command(kCmdViewFirst + kViewSmsFolder);
    } else if (OnCard([this] { return SmsStorageFull(context_.link); }) == 1 &&
               hooks_.simFullAlert) {
        hooks_.simFullAlert(1);
    }
}

long SmsFolderView::OnMessage(unsigned msg, long wParam, long) {
    switch (msg) {
        case kMsgViewShown:
            if (cardState_() == 1) {
                Reload();  // the handheld folder is there without the card
            } else if (refreshState_ == kFolderNotRefreshed) {
                StartRefresh();
            } else if (refreshState_ == kFolderRefreshed &&
                       IndexListCount(context_.settings, kNewIdx) > 0) {
                // The card is read aside; the filing, which fills the lists, stays here.
                if (OnCard([this] { return SmsIntakeRead(store_, context_.link); }))
                    SmsIntakeFile(store_);
            }
            break;
        case kMsgSimRefreshDone:
            OnRefreshDone();
            break;
        case kMsgCardStateChanged:
            OnCardState();
            break;
        case kMsgFolderBox: {
            const auto* request = reinterpret_cast<const BoxRequest*>(wParam);
            ShowBox(request->text, request->title);
            break;
        }
        case kMsgRefreshLists:
        case kMsgSimCacheBuilt:
        case kMsgOutlookCacheBuilt:
            Reload();
            break;
        case kWmCommand:
            OnOutsideCommand(static_cast<int>(wParam & 0xFFFF));
            break;
        default:
            break;
    }
    return 0;
}

// A control's command from outside (a script driving the dialer through its socket): a page's
// list brings that page forward with every row selected, as Ctrl+A there does; a button of the
// page in front is clicked. Other pages' buttons are hidden, and so not taken.
void SmsFolderView::OnOutsideCommand(int id) {
    const int listPage = id - kFolderListFirstId;
    if (listPage >= 0 && listPage < kPageCount && lists_[listPage]) {
        SelectPage(listPage);
        lists_[listPage]->selectAll();
        return;
    }
    const int page = pages_.current;
    if (page < 0 || page >= kPageCount) return;
    for (QPushButton* button : {replies_[page], forwards_[page], deletes_[page]})
        if (button && ControlId(button) == id && button->isEnabled()) button->click();
}

}  // namespace vqm
