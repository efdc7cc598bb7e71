#include "contacts/contact_picker_view.h"

#include <QApplication>
#include <QHeaderView>
#include <QMenu>
#include <QMetaObject>
#include <QPushButton>
#include <QResizeEvent>
#include <QTabBar>
#include <QTreeWidget>
#include <QVBoxLayout>
#include <algorithm>

#include "contacts/contact_pages_view.h"
#include "link/link.h"
#include "shell/messages.h"

namespace vqm {

namespace {

constexpr int kButtonWidth = 55, kButtonHeight = 26;

QString Q(const std::u16string& text) {
    return QString::fromStdU16String(text);
}

}  // namespace

ContactPickerView::ContactPickerView(QWidget* parent, ShellContext& context,
                                     PhonebookCaches* caches, PickerHooks hooks)
    : View(parent), context_(context), hooks_(std::move(hooks)) {
    if (!caches) ownCaches_ = std::make_unique<PhonebookCaches>(context.settings);
    caches_ = caches ? caches : ownCaches_.get();
    cardState_ = [&context] {
        return context.mainWindow ? context.mainWindow->App().cardState : 0;
    };
    if (parent)
        resize(parent->width(), parent->height() - kMenuBarHeight);
    else
        resize(240, 320 - kMenuBarHeight);

    CreateContactPages(this, "CONTACTS", kPickerTabId, kPickerOutlookTabId, pages_, outlookPages_,
                       [this](QWidget* page, int n) { lists_[n] = MakeList(page, n); });
    ok_ = new QPushButton("OK", this);
    SetControlId(ok_, kPickerOkId);
    QObject::connect(ok_, &QPushButton::clicked, this, [this] { Ok(); });
    cancel_ = new QPushButton("Cancel", this);
    SetControlId(cancel_, kPickerCancelId);
    QObject::connect(cancel_, &QPushButton::clicked, this, [this] { Cancel(); });
    Relayout();
    // The builders report through a layer of the view's own, made on the view's thread, which
    // owns it. Each report holds the layer, so a builder that ends after the view is gone finds
    // it closed and goes on; the view never waits for the shared builder threads, one of which
    // may be waiting for another view's window.
    auto slot = std::make_shared<std::weak_ptr<MessageLayer>>();
    messages_ = std::make_shared<MessageLayer>([slot] {
        QMetaObject::invokeMethod(
            qApp,
            [slot] {
                if (std::shared_ptr<MessageLayer> layer = slot->lock()) layer->DeliverPending();
            },
            Qt::QueuedConnection);
    });
    *slot = messages_;
}

ContactPickerView::~ContactPickerView() {
    messages_->Close();  // reports still on their way are refused from here on
}

CacheNotify ContactPickerView::Notifier() {
    return [this, layer = messages_](unsigned msg) { layer->Send(this, msg, 0, 0); };
}

QTreeWidget* ContactPickerView::MakeList(QWidget* page, int index) {
    auto* list = new QTreeWidget(page);
    list->setObjectName("ListView");
    SetControlId(list, kPickerListFirstId + index);
    list->setColumnCount(2);
    list->setHeaderLabels({"Name", "Phone"});
    list->setColumnWidth(0, 110);
    list->setColumnWidth(1, 110);
    list->setRootIsDecorated(false);
    list->setUniformRowHeights(true);
    list->setSelectionMode(QAbstractItemView::SingleSelection);  // a tap highlights one row
    list->header()->setStretchLastSection(false);
    auto* layout = new QVBoxLayout(page);
    layout->setContentsMargins(0, 0, 0, 0);
    layout->addWidget(list);

    auto* menu = new QMenu(list);
    menu->addAction("Select All", this, [this, index] { TickAll(index, true); })
        ->setData(kCmdPickerSelectAll);
    menu->addAction("Clear All", this, [this, index] { TickAll(index, false); })
        ->setData(kCmdPickerClearAll);
    menus_[index] = menu;
    list->setContextMenuPolicy(Qt::CustomContextMenu);
    QObject::connect(list, &QWidget::customContextMenuRequested, this, [this, index](QPoint pos) {
        PrepareMenu(index, pos)->popup(List(index)->viewport()->mapToGlobal(pos));
    });
    return list;
}

QMenu* ContactPickerView::PrepareMenu(int page, QPoint) {
    return page >= 0 && page < kPickerPageCount ? menus_[page] : nullptr;
}

QTreeWidget* ContactPickerView::List(int page) const {
    return page >= 0 && page < kPickerPageCount ? lists_[page] : nullptr;
}

int ContactPickerView::CurrentPage() const {
    if (pages_.current < 2) return pages_.current;
    return kPickerMobilePage + outlookPages_.current;
}

void ContactPickerView::ShowPage(int page) {
    auto* tabs = qobject_cast<QTabBar*>(FindControl(this, kPickerTabId));
    if (!tabs) return;
    tabs->setCurrentIndex(std::min(page, 2));
    if (page >= kPickerMobilePage)
        if (auto* inner = qobject_cast<QTabBar*>(FindControl(this, kPickerOutlookTabId)))
            inner->setCurrentIndex(page - kPickerMobilePage);
}

void ContactPickerView::Relayout() {
    const int w = width(), h = height();
    // The pages take the client area inset by 4, moved down 2, less 32 at the bottom.
    const int left = 4, top = 6, inner = std::max(0, w - 8);
    const int pagesHeight = std::max(0, h - top - 4 - 32 - kMenuBarHeight);
    if (auto* tabs = qobject_cast<QTabBar*>(FindControl(this, kPickerTabId)))
        tabs->setGeometry(left, top + pagesHeight, inner, kMenuBarHeight);
    for (ViewRecord& record : pages_.records) {
        record.rect = QRect(left, top, inner, pagesHeight);
        if (record.window) record.window->setGeometry(record.rect);
    }
    if (View* outlook = pages_.records.size() > 2 ? pages_.records[2].window : nullptr) {
        const int innerHeight = std::max(0, pagesHeight - kMenuBarHeight);
        if (auto* tabs = qobject_cast<QTabBar*>(FindControl(outlook, kPickerOutlookTabId)))
            tabs->setGeometry(0, innerHeight, inner, kMenuBarHeight);
        for (ViewRecord& record : outlookPages_.records) {
            record.rect = QRect(0, 0, inner, innerHeight);
            if (record.window) record.window->setGeometry(record.rect);
        }
    }
    const int buttonsTop = h - kButtonHeight - 3;
    ok_->setGeometry(w - 116, buttonsTop, kButtonWidth, kButtonHeight);
    cancel_->setGeometry(w - 55, buttonsTop, kButtonWidth, kButtonHeight);
}

void ContactPickerView::resizeEvent(QResizeEvent* event) {
    View::resizeEvent(event);
    Relayout();
}

void ContactPickerView::LoadPage(int page) {
    QTreeWidget* list = List(page);
    if (!list) return;
    list->clear();
    LoadPickerRows(*caches_, page, &rows_[page]);
    for (const PickerRow& row : rows_[page]) {
        auto* item = new QTreeWidgetItem(list);
        item->setText(0, Q(row.name));
        item->setText(1, Q(row.number));
        item->setFlags(item->flags() | Qt::ItemIsUserCheckable);
        item->setCheckState(0, Qt::Unchecked);
    }
}

void ContactPickerView::TickAll(int page, bool ticked) {
    QTreeWidget* list = List(page);
    if (!list) return;
    for (int i = 0; i < list->topLevelItemCount(); ++i)
        list->topLevelItem(i)->setCheckState(0, ticked ? Qt::Checked : Qt::Unchecked);
}

void ContactPickerView::Ok() {
    PickerTicks ticked;
    for (int page = 0; page < kPickerPageCount; ++page) {
        QTreeWidget* list = List(page);
        if (!list) continue;
        // Rows are listed in the order they were loaded, so row i is rows_[page][i].
        for (int i = 0; i < list->topLevelItemCount(); ++i)
            ticked[page].push_back(list->topLevelItem(i)->checkState(0) != Qt::Unchecked);
    }
    const std::u16string text = PickedRecipients(rows_, ticked);
    if (hooks_.pick) hooks_.pick(text);
}

void ContactPickerView::Cancel() {
    if (hooks_.cancel) hooks_.cancel();
}

void ContactPickerView::Do(unsigned work) {
    if (work & kPickerOutlookClear) OutlookCacheClear(*caches_, Notifier());
    if (work & kPickerSimLoad) SimCacheLoad(*caches_, context_.link, Notifier());
    if (work & kPickerReloadOutlook)
        for (int page = kPickerMobilePage; page <= kPickerWorkPage; ++page)
            LoadPage(page);
    if (work & kPickerReloadSim) {
        LoadPage(kPickerSimPage);
        LoadPage(kPickerCardPage);
    }
    if (work & kPickerClearTicks)
        for (int page = 0; page < kPickerPageCount; ++page)
            TickAll(page, false);
}

long ContactPickerView::OnMessage(unsigned msg, long, long) {
    switch (msg) {
        case kMsgViewShown:
            Do(PickerActivated(state_, cardState_(), PickerCacheSignature(*caches_)));
            break;
        case kMsgOutlookCacheBuilt:
            Do(PickerOutlookDone(state_, cardState_()));
            break;
        case kMsgSimCacheBuilt:
            Do(PickerSimDone(state_, PickerCacheSignature(*caches_)));
            break;
        default:
            break;
    }
    return 0;
}

}  // namespace vqm
