#include "shell/views.h"

#include <QAction>
#include <QFont>
#include <QTabBar>
#include <QVariant>

#include "shell/messages.h"

namespace vqm {

namespace {
constexpr char kIdProperty[] = "vqmControlId";
}

void SetControlId(QWidget* control, int id) {
    control->setProperty(kIdProperty, id);
}

int ControlId(const QWidget* control) {
    return control->property(kIdProperty).toInt();
}

QWidget* FindControl(QWidget* root, int id) {
    if (!root) return nullptr;
    for (QWidget* child : root->findChildren<QWidget*>())
        if (ControlId(child) == id) return child;
    return nullptr;
}

int CreateView(QWidget* parent, ViewRecord& record) {
    record.parent = parent;
    record.window = record.windowProc ? record.windowProc(parent) : nullptr;
    if (!record.window) return 0;
    record.window->setObjectName(QString::fromStdString(record.className));
    record.window->setAutoFillBackground(true);
    QPalette palette = record.window->palette();
    palette.setColor(QPalette::Window, Qt::white);
    record.window->setPalette(palette);
    record.window->setGeometry(record.rect);
    record.window->show();
    return 1;
}

void ShowView(ViewSet& set) {
    if (set.current < 0 || set.current >= set.Count()) return;
    for (int i = 0; i < set.Count(); ++i)
        if (i != set.current && set.records[i].window) set.records[i].window->hide();
    View* view = set.records[set.current].window;
    if (!view) return;
    view->show();
    view->update();
    view->OnMessage(kMsgViewShown, 0, 0);
}

void SwitchView(ViewSet& set, int index) {
    if (index == set.current) return;
    set.current = index;
    ShowView(set);
}

void CheckViewButton(const ViewButtons& buttons, int index) {
    if (index < 0 || index >= static_cast<int>(buttons.size()) || !buttons[index]) return;
    buttons[index]->setChecked(true);
}

void EnableViewButton(const ViewButtons& buttons, int index) {
    if (index < 0 || index >= static_cast<int>(buttons.size()) || !buttons[index]) return;
    buttons[index]->setEnabled(true);
}

void DisableViewButton(const ViewButtons& buttons, int index) {
    if (index < 0 || index >= static_cast<int>(buttons.size()) || !buttons[index]) return;
    buttons[index]->setEnabled(false);
}

int CreateTabbedPages(QWidget* parent, int tabId, ViewSet& set, QRect rect) {
    rect.setHeight(rect.height() - kMenuBarHeight);
    auto* tabs = new QTabBar(parent);
    SetControlId(tabs, tabId);
    tabs->setShape(QTabBar::RoundedSouth);
    tabs->setExpanding(false);
    tabs->setGeometry(rect.left(), rect.bottom() + 1, rect.width(), kMenuBarHeight);
    for (const ViewRecord& record : set.records)
        tabs->addTab(QString::fromStdU16String(record.caption));
    int created = 0;
    for (ViewRecord& record : set.records) {
        record.rect = rect;
        if (!CreateView(parent, record)) break;
        ++created;
    }
    tabs->setCurrentIndex(set.current);
    tabs->show();
    QObject::connect(tabs, &QTabBar::currentChanged, parent,
                     [&set](int index) { SwitchView(set, index); });
    ShowView(set);
    return created;
}

void FitTabTitles(QWidget* parent, int tabId) {
    auto* tabs = qobject_cast<QTabBar*>(FindControl(parent, tabId));
    if (!tabs) return;
    tabs->setUsesScrollButtons(false);
    tabs->setExpanding(true);
    // A point smaller than the pages' text: "SIM Card", "Card Phone" and "Outlook" then fit.
    QFont font = tabs->font();
    font.setPointSizeF(font.pointSizeF() - 1);
    tabs->setFont(font);
}

void GetViewRect(const ViewSet& set, QRect* rect) {
    if (set.current >= 0 && set.current < set.Count()) *rect = set.records[set.current].rect;
}

}  // namespace vqm
