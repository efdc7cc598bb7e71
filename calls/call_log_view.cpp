#include "calls/call_log_view.h"

#include <QApplication>
#include <QFontInfo>
#include <QFontMetrics>
#include <QHeaderView>
#include <QLabel>
#include <QMenu>
#include <QMetaObject>
#include <QResizeEvent>
#include <QStyle>
#include <QTabBar>
#include <QThread>
#include <QTreeWidget>
#include <QVBoxLayout>
#include <algorithm>
#include <cstring>
#include <vector>

#include "calls/dial_pad_view.h"
#include "shell/messages.h"
#include "support/numbers.h"
#include "support/text.h"

namespace vqm {

namespace {

struct PageInfo {
    const char16_t* title;
    const char* className;
};
constexpr PageInfo kPages[kCallLogCount] = {
    {u"Answered", "CALLLOG_INCOMING_PAGE"},
    {u"Dialed", "CALLLOG_OUTGOING_PAGE"},
    {u"Unanswered", "CALLLOG_MISSED_PAGE"},
};

// The Outlook names are the longest: 128 bytes.
constexpr size_t kNameSize = 140;
// Room a list cell keeps beside its text.
constexpr int kCellPadding = 10;
constexpr int kMinListPixels = 8;

// The font and the date column of a list as wide as width: the date and a 15-digit
// international number side by side, room kept for a scroll bar.
void FitColumns(QTreeWidget* list, int width) {
    const int room = width - 2 * list->frameWidth() -
                     list->style()->pixelMetric(QStyle::PM_ScrollBarExtent, nullptr, list) -
                     2 * kCellPadding;
    QFont font = QApplication::font(list);
    int pixels = QFontInfo(font).pixelSize();
    auto need = [&font](int size) {
        font.setPixelSize(size);
        const QFontMetrics metrics(font);
        return metrics.horizontalAdvance("00:00:00,00/00/0000") +
               metrics.horizontalAdvance("+000000000000000");
    };
    while (pixels > kMinListPixels && need(pixels) > room)
        --pixels;
    font.setPixelSize(pixels);
    list->setFont(font);
    list->setColumnWidth(
        kColumnDateTime,
        QFontMetrics(font).horizontalAdvance("00:00:00,00/00/0000") + kCellPadding);
}
// Sort keys are compared on at most this many characters.
constexpr int kSortTextLength = 32;

QString Wide(const char* narrow, size_t size) {
    char16_t wide[kNameSize];
    NarrowToWide(narrow, wide, static_cast<int>(strnlen(narrow, size)), kNameSize);
    return QString::fromStdU16String(wide);
}

std::string Narrow(const QString& text, int maxLength) {
    const std::u16string wide = text.toStdU16String();
    char narrow[kNameSize];
    WideToNarrow(wide.c_str(), narrow, std::min<int>(static_cast<int>(wide.size()), maxLength),
                 sizeof narrow);
    return narrow;
}

}  // namespace

CallLogView::CallLogView(QWidget* parent, ShellContext& context, CallLog* callLog,
                         PhonebookCaches* caches, DialFunction dial)
    : View(parent), context_(context), dial_(std::move(dial)) {
    if (!callLog) ownCallLog_ = std::make_unique<CallLog>(context.settings);
    if (!caches) ownCaches_ = std::make_unique<PhonebookCaches>(context.settings);
    callLog_ = callLog ? callLog : ownCallLog_.get();
    caches_ = caches ? caches : ownCaches_.get();
    cardState_ = [&context] {
        return context.mainWindow ? context.mainWindow->App().cardState : 0;
    };

    // Laid out at the size the main window gives its views, before the shell places us.
    if (parent)
        resize(parent->width(), parent->height() - kMenuBarHeight);
    else
        resize(240, 320 - kMenuBarHeight);

    label_ = new QLabel("Call Logs:", this);
    for (int log = 1; log <= kCallLogCount; ++log) {
        ViewRecord record;
        record.caption = kPages[log - 1].title;
        record.className = kPages[log - 1].className;
        record.windowProc = [this, log](QWidget* pageParent) -> View* {
            auto* page = new View(pageParent);
            lists_[log - 1] = MakeList(page, log);
            return page;
        };
        pages_.records.push_back(std::move(record));
    }
    const int top = 2 + kCallLogLabelHeight + 2;
    CreateTabbedPages(this, kCallLogTabId, pages_, QRect(0, top, width(), height() - top));
    // Three titles share a narrow strip: squeeze them in rather than scroll.
    if (auto* tabs = qobject_cast<QTabBar*>(FindControl(this, kCallLogTabId))) {
        tabs->setUsesScrollButtons(false);
        tabs->setExpanding(true);
    }
    Relayout();

    EnsureCallLogLimits(*callLog_);
    // The dial thread appends too; its news is handled here on the view's own thread.
    callLog_->listener = [this](int log, CallLogChange change, const CallLogRecord* record) {
        if (QThread::currentThread() == thread()) {
            OnLogChanged(log, change, record);
            return;
        }
        const CallLogRecord copy = record ? *record : CallLogRecord{};
        const bool hasRecord = record != nullptr;
        QMetaObject::invokeMethod(
            this,
            [this, log, change, copy, hasRecord] {
                OnLogChanged(log, change, hasRecord ? &copy : nullptr);
            },
            Qt::QueuedConnection);
    };
    for (int log = 1; log <= kCallLogCount; ++log)
        LoadCallLog(log);
}

CallLogView::~CallLogView() {
    callLog_->listener = nullptr;
}

QTreeWidget* CallLogView::MakeList(QWidget* page, int log) {
    auto* list = new QTreeWidget(page);
    list->setObjectName("ListView");
    SetControlId(list, kCallLogListFirstId + log - 1);
    list->setColumnCount(4);
    list->setHeaderLabels({"Call", "Date & Time", "", ""});
    // The date takes what its text needs and the call the rest of the width, which holds a
    // 15-digit international number; a longer one loses its middle, never its ends.
    // (FitColumns sizes them to the page.)
    list->header()->setSectionResizeMode(kColumnCall, QHeaderView::Stretch);
    list->header()->setSectionResizeMode(kColumnDateTime, QHeaderView::Fixed);
    list->setTextElideMode(Qt::ElideMiddle);
    // The number and the sequence number stay with each row for the commands, unseen.
    list->header()->setMinimumSectionSize(0);
    for (int column : {kColumnNumber, kColumnSequence}) {
        list->setColumnWidth(column, 0);
        list->setColumnHidden(column, true);
    }
    list->setRootIsDecorated(false);
    list->setUniformRowHeights(true);
    list->setSelectionMode(QAbstractItemView::ExtendedSelection);
    list->setSortingEnabled(false);
    list->header()->setSectionsClickable(true);
    list->header()->setStretchLastSection(false);
    // The selection stays visible when the list loses the focus.
    QPalette palette = list->palette();
    palette.setColor(QPalette::Inactive, QPalette::Highlight,
                     palette.color(QPalette::Active, QPalette::Highlight));
    palette.setColor(QPalette::Inactive, QPalette::HighlightedText,
                     palette.color(QPalette::Active, QPalette::HighlightedText));
    list->setPalette(palette);

    auto* layout = new QVBoxLayout(page);
    layout->setContentsMargins(0, 0, 0, 0);
    layout->addWidget(list);

    QObject::connect(list->header(), &QHeaderView::sectionClicked, this,
                     [this, log](int column) { OnHeaderTap(log, column); });

    Menu& menu = menus_[log - 1];
    menu.menu = new QMenu(list);
    menu.makeCall = menu.menu->addAction("Make Call", this, [this, log] { MakeCall(log); });
    menu.menu->addSeparator();
    menu.remove = menu.menu->addAction("Delete", this, [this, log] { DeleteSelected(log); });
    menu.clearThis = menu.menu->addAction("Clear This Log", this, [this] {
        const int shown = CurrentLog();
        ClearCallLog(*callLog_, shown);
        if (QTreeWidget* shownList = List(shown)) shownList->clear();
    });
    menu.clearAll = menu.menu->addAction("Clear All Logs", this, [this] {
        ClearAllCallLogs(*callLog_);
        for (QTreeWidget* each : lists_)
            if (each) each->clear();
    });
    list->setContextMenuPolicy(Qt::CustomContextMenu);
    QObject::connect(list, &QWidget::customContextMenuRequested, this, [this, log](QPoint pos) {
        QTreeWidget* target = List(log);
        PrepareMenu(log, pos)->popup(target->viewport()->mapToGlobal(pos));
    });
    return list;
}

QTreeWidget* CallLogView::List(int log) const {
    return log >= 1 && log <= kCallLogCount ? lists_[log - 1] : nullptr;
}

void CallLogView::Relayout() {
    const int w = width(), h = height();
    label_->setGeometry(4, 2, std::max(0, w - 8), kCallLogLabelHeight);
    // Pages fill what the label leaves, the tab strip along their bottom.
    const int top = 2 + kCallLogLabelHeight + 2;
    const int pageHeight = std::max(0, h - top - kMenuBarHeight);
    if (auto* tabs = qobject_cast<QTabBar*>(FindControl(this, kCallLogTabId)))
        tabs->setGeometry(0, top + pageHeight, w, kMenuBarHeight);
    for (ViewRecord& record : pages_.records) {
        record.rect = QRect(0, top, w, pageHeight);
        if (record.window) record.window->setGeometry(record.rect);
    }
    for (QTreeWidget* list : lists_)
        if (list) FitColumns(list, w);
}

void CallLogView::resizeEvent(QResizeEvent* event) {
    View::resizeEvent(event);
    Relayout();
}

long CallLogView::OnMessage(unsigned msg, long, long) {
    switch (msg) {
        case kMsgViewShown:
        case kMsgRefreshLists:
            for (int log = 1; log <= kCallLogCount; ++log)
                LoadCallLog(log);
            break;
        case kMsgSimCacheBuilt:
        case kMsgOutlookCacheBuilt:
            RefreshCallLogNames();
            break;
        default:
            break;
    }
    return 0;
}

void CallLogView::AddItem(int log, const CallLogRecord& record) {
    QTreeWidget* list = List(log);
    if (!list) return;
    const QString number = Wide(record.number, sizeof record.number);
    QString shown = number;
    char16_t name[kNameSize];
    if (!number.isEmpty() && FindNameByNumber(*caches_, record.number, name, kNameSize) &&
        name[0] != u'\0')
        shown = QString::fromStdU16String(name);
    if (shown.isEmpty()) shown = "No number";
    auto* item = new QTreeWidgetItem(list);
    item->setText(kColumnCall, shown);
    item->setText(kColumnDateTime, Wide(record.time, sizeof record.time));
    item->setText(kColumnNumber, number);
    item->setText(kColumnSequence, QString::number(record.sequence));
}

void CallLogView::LoadCallLog(int log) {
    QTreeWidget* list = List(log);
    if (!list) return;
    list->clear();
    for (const CallLogRecord& record : ReadCallLog(*callLog_, log))
        AddItem(log, record);
    sortFlag_[log - 1] = 1;
    SortList(log, kColumnDateTime);
    sortFlag_[log - 1] = 2;
}

void CallLogView::SortList(int log, int column) {
    QTreeWidget* list = List(log);
    if (!list || (column != kColumnCall && column != kColumnDateTime)) return;
    const int flag = sortFlag_[log - 1];
    // Flag 1 is the order a load shows: the newest call first (CompareDateTime's direction 1)
    // and names A to Z; flag 2 the reverse of each.
    const int direction = column == kColumnDateTime ? (flag == 1 ? 1 : 0) : (flag == 1 ? 0 : 1);
    auto compare = column == kColumnDateTime ? CompareDateTime : CompareText;

    QTreeWidgetItem* current = list->currentItem();
    std::vector<std::pair<std::string, QTreeWidgetItem*>> rows;
    std::vector<QTreeWidgetItem*> selected;
    for (QTreeWidgetItem* item : list->selectedItems())
        selected.push_back(item);
    while (list->topLevelItemCount() > 0) {
        QTreeWidgetItem* item = list->takeTopLevelItem(0);
        rows.emplace_back(Narrow(item->text(column), kSortTextLength), item);
    }
    std::stable_sort(rows.begin(), rows.end(), [&](const auto& a, const auto& b) {
        return compare(direction, a.first.c_str(), static_cast<int>(a.first.size()),
                       b.first.c_str(), static_cast<int>(b.first.size())) < 0;
    });
    for (auto& row : rows)
        list->addTopLevelItem(row.second);
    if (current) list->setCurrentItem(current, 0, QItemSelectionModel::NoUpdate);
    for (QTreeWidgetItem* item : selected)
        item->setSelected(true);
}

void CallLogView::OnHeaderTap(int log, int column) {
    if (column != kColumnCall && column != kColumnDateTime) return;
    SortList(log, column);
    int& flag = sortFlag_[log - 1];
    flag = flag == 1 ? 2 : 1;
}

void CallLogView::OnLogChanged(int log, CallLogChange change, const CallLogRecord* record) {
    QTreeWidget* list = List(log);
    if (!list) return;
    switch (change) {
        case CallLogChange::Appended:
            if (!record) return;
            AddItem(log, *record);
            sortFlag_[log - 1] = 1;
            SortList(log, kColumnDateTime);
            sortFlag_[log - 1] = 2;
            break;
        case CallLogChange::Reloaded:
            LoadCallLog(log);
            break;
        case CallLogChange::Cleared:
            list->clear();
            break;
    }
}

void CallLogView::RefreshCallLogNames() {
    for (QTreeWidget* list : lists_) {
        if (!list) continue;
        for (int i = 0; i < list->topLevelItemCount(); ++i) {
            QTreeWidgetItem* item = list->topLevelItem(i);
            const std::string number = Narrow(item->text(kColumnNumber), kCallLogNumberSize - 1);
            char16_t name[kNameSize];
            if (!number.empty() && FindNameByNumber(*caches_, number.c_str(), name, kNameSize) &&
                name[0] != u'\0')
                item->setText(kColumnCall, QString::fromStdU16String(name));
        }
    }
}

QMenu* CallLogView::PrepareMenu(int log, QPoint pos) {
    QTreeWidget* list = List(log);
    Menu& menu = menus_[log - 1];
    QTreeWidgetItem* tapped = list->itemAt(pos);
    // A tap on one of several selected rows keeps them all for Delete.
    if (tapped && list->selectedItems().size() < 2) {
        list->clearSelection();
        list->setCurrentItem(tapped);
        tapped->setSelected(true);
    }
    const bool onEntry = tapped && !list->selectedItems().isEmpty();
    menu.makeCall->setEnabled(onEntry && cardState_() != 1);
    menu.remove->setEnabled(onEntry);
    return menu.menu;
}

void CallLogView::MakeCall(int log) {
    QTreeWidget* list = List(log);
    if (!list) return;
    QTreeWidgetItem* item = list->currentItem();
    if (!item && !list->selectedItems().isEmpty()) item = list->selectedItems().front();
    if (!item) return;
    // The first column may show a name; the number it stands for is kept beside it.
    const QString number = item->text(kColumnNumber);
    if (number.isEmpty() || !dial_) return;
    dial_(number.toStdU16String());
}

void CallLogView::DeleteSelected(int log) {
    QTreeWidget* list = List(log);
    if (!list) return;
    std::vector<int32_t> sequences;
    for (int i = 0; i < list->topLevelItemCount(); ++i) {
        QTreeWidgetItem* item = list->topLevelItem(i);
        if (item->isSelected() || item == list->currentItem())
            sequences.push_back(item->text(kColumnSequence).toInt());
    }
    for (int32_t sequence : sequences)
        DeleteCallLogEntry(*callLog_, log, sequence);
    LoadCallLog(log);
}

}  // namespace vqm
