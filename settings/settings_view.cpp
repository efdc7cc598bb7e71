#include "settings/settings_view.h"

#include <QApplication>
#include <QMetaObject>
#include <QTabBar>

#include "settings/barring_page.h"
#include "settings/call_waiting_page.h"
#include "settings/centre_page.h"
#include "settings/forward_page.h"
#include "settings/general_page.h"
#include "settings/modem_page.h"
#include "settings/network_page.h"
#include "settings/security_page.h"
#include "settings/tones_page.h"
#include "shell/messages.h"

namespace vqm {

namespace {

using PageFactory = View* (*)(QWidget* parent, ShellContext& context);

template <class Page>
View* Make(QWidget* parent, ShellContext& context) {
    return new Page(parent, context);
}
// A page whose class is still being written: an empty window of its class.
View* Empty(QWidget* parent, ShellContext&) {
    return new View(parent);
}

struct PageInfo {
    const char16_t* caption;
    const char* className;
    PageFactory make;
};

// ---- The settings pages, in tab order. A page's builder swaps Empty for Make<ItsPage>. ----
const PageInfo kPages[kSettingsPageCount] = {
    {u"General", "SETTINGS_GENERAL_PAGE", Make<GeneralPage>},
    {u"Messages", "SETTINGS_MESSAGES_PAGE", Make<CentrePage>},
    {u"Network", "SETTINGS_NETWORK_PAGE", Make<NetworkPage>},
    {u"Call Forward", "SETTINGS_CALLFORWARD_PAGE", Make<ForwardPage>},
    {u"Call Barring", "SETTINGS_CALLBARRING_PAGE", Make<BarringPage>},
    {u"Security", "SETTINGS_SECURITY_PAGE", Make<SecurityPage>},
    {u"Modem", "SETTINGS_MODEM_PAGE", Make<ModemPage>},
    {u"Call Waiting", "SETTINGS_CALLWAITING_PAGE", Make<CallWaitingPage>},
    {u"Tones", "SETTINGS_TONES_PAGE", Make<TonesPage>},
};
// ---- end of the pages ----

}  // namespace

CardExchange::~CardExchange() {
    worker_.Stop();
    worker_.Join();
    if (busy_) QApplication::restoreOverrideCursor();
}

bool CardExchange::Run(std::function<int()> work, std::function<void(int result)> done) {
    if (busy_) return false;
    busy_ = true;
    QApplication::setOverrideCursor(Qt::WaitCursor);
    worker_.Post([this, work = std::move(work), done = std::move(done)] {
        const int result = work();
        // Queued to the owner: dropped by Qt if the page is gone by then.
        QMetaObject::invokeMethod(
            owner_,
            [this, result, done] {
                busy_ = false;
                QApplication::restoreOverrideCursor();
                done(result);
            },
            Qt::QueuedConnection);
    });
    return true;
}

SettingsView::SettingsView(QWidget* parent, ShellContext& context)
    : View(parent), context_(context) {
    cardState_ = [&context] {
        return context.mainWindow ? context.mainWindow->App().cardState : 0;
    };
    // Laid out at the size the main window gives its views, before the shell places us.
    if (parent)
        resize(parent->width(), parent->height() - kMenuBarHeight);
    else
        resize(240, 320 - kMenuBarHeight);

    for (const PageInfo& info : kPages) {
        ViewRecord record;
        record.caption = info.caption;
        record.className = info.className;
        record.windowProc = [this, make = info.make](QWidget* pageParent) -> View* {
            return make(pageParent, context_);
        };
        pages_.records.push_back(std::move(record));
    }
    CreateTabbedPages(this, kSettingsTabId, pages_, rect());
    // Nine titles do not fit 240 pixels: the strip keeps one row and scrolls with its arrows,
    // each title whole.
    if (auto* tabs = qobject_cast<QTabBar*>(FindControl(this, kSettingsTabId))) {
        tabs->setUsesScrollButtons(true);
        tabs->setElideMode(Qt::ElideNone);
        tabs->setExpanding(false);
    }
    FollowCardState();
}

View* SettingsView::Page(int index) const {
    return index >= 0 && index < pages_.Count() ? pages_.records[index].window : nullptr;
}

void SettingsView::SetCardStateSource(std::function<int()> source) {
    cardState_ = std::move(source);
    FollowCardState();
}

void SettingsView::FollowCardState() {
    // Every page works on the card or on settings the card acts on: none of it is for a
    // card that is not there.
    setEnabled(cardState_() == 2);
}

// Pages hear of the card state with the state itself in wParam.
long SettingsView::OnMessage(unsigned msg, long wParam, long lParam) {
    if (msg == kMsgCardStateChanged) FollowCardState();
    if (msg == kWmCommand) {
        const int id = static_cast<int>(wParam & 0xFFFF);
        if (id >= kSettingsPageCommandFirst && id < kSettingsPageCommandFirst + pages_.Count()) {
            if (auto* tabs = qobject_cast<QTabBar*>(FindControl(this, kSettingsTabId)))
                tabs->setCurrentIndex(id - kSettingsPageCommandFirst);
            return 0;
        }
        View* page = Page(pages_.current);
        return page ? page->OnMessage(msg, wParam, lParam) : 0;
    }
    // The view coming forward shows its current page again; the card's news is for every page.
    if (msg == kMsgViewShown) {
        View* page = Page(pages_.current);
        return page ? page->OnMessage(msg, wParam, lParam) : 0;
    }
    if (msg == kMsgCardStateChanged) {
        for (ViewRecord& record : pages_.records)
            if (record.window) record.window->OnMessage(msg, cardState_(), lParam);
    }
    return 0;
}

}  // namespace vqm
