#include "shell/main_window.h"

#include <QActionGroup>
#include <QApplication>
#include <QCloseEvent>
#include <QDialog>
#include <QDialogButtonBox>
#include <QEventLoop>
#include <QKeyEvent>
#include <QLabel>
#include <QMenu>
#include <QPainter>
#include <QScreen>
#include <QToolBar>
#include <QToolButton>
#include <QVBoxLayout>
#include <atomic>
#include <cstdio>

#include "link/link.h"
#include "shell/card_host.h"
#include "shell/dialogs.h"
#include "shell/icons.h"
#include "shell/messages.h"
#include "shell/notifier.h"
#include "shell/ui_log.h"
#include "support/local_socket.h"

namespace vqm {

namespace {

constexpr int kAboutFirmwareId = 1161, kAboutProgramId = 1163;

struct ViewInfo {
    const char* className;
    const char16_t* title;
};
constexpr ViewInfo kViewTable[kViewCount] = {
    {"DIALPAD_VIEW", u"DialPad"},      {"WRITESMS_VIEW", u"Write SMS"},
    {"SMSFOLDER_VIEW", u"SMS Folder"}, {"MANAGECONTACTS_VIEW", u"Manage Contacts"},
    {"SETTINGS_VIEW", u"Settings"},    {"CALLLOG_VIEW", u"Call Log"},
    {"CONTACTS_VIEW", u"Contacts"},
};

}  // namespace

MainWindow::MainWindow(ShellContext& context, std::array<ViewFactory, kViewCount> factories,
                       CardHost* card)
    : context_(context),
      messages_([this] {
          QMetaObject::invokeMethod(
              this, [this] { messages_.DeliverPending(); }, Qt::QueuedConnection);
      }),
      ownCardHost_(card ? nullptr
                        : std::make_unique<LinkCardHost>(
                              context.link, WindowSocketPath(context.runtimeRoot, kCompanionClass),
                              &messages_)),
      card_(card ? *card : *ownCardHost_),
      watch_(app_, context.settings, *this, card_, busy_) {
    context_.messages = &messages_;
    context_.mainWindow = this;
    setObjectName(kMainWindowClass);
    setWindowTitle(QString::fromStdU16String(kMainWindowTitle));
    setWindowIcon(ProgramIcon(101));
    setAutoFillBackground(true);
    QPalette palette = this->palette();
    palette.setColor(QPalette::Window, Qt::white);
    setPalette(palette);
    resize(240, 320);

    // The listener's call-list news, sent to the window as the card watch's thread expects.
    context_.link.postToMain = [this](int msg) {
        // A silent card closes the link, which joins the listener: that news must not keep
        // the listener waiting for its own end.
        if (msg == kMsgCardSilent)
            messages_.Post(this, static_cast<unsigned>(msg), 0, 0);
        else
            messages_.Send(this, static_cast<unsigned>(msg), 0, 0);
    };
    notifier_ = new Notifier(
        [this](int id) {
            if (id == kCmdNotificationTapped) Command(kCmdNotificationTapped);
        },
        this);

    // WM_CREATE
    BuildMenuBar();
    tray_ = new QSystemTrayIcon(this);
    tray_->setToolTip("Dialer");
    QObject::connect(tray_, &QSystemTrayIcon::activated, this, [this](auto reason) {
        if (reason == QSystemTrayIcon::Trigger || reason == QSystemTrayIcon::Context)
            OnMessage(kMsgTrayIcon, kTrayIconId, kWmLButtonDown);
    });
    SetTrayIcon(kIconNotConnected);
    if (QSystemTrayIcon::isSystemTrayAvailable()) tray_->show();
    CreateViews(factories);
    app_.displayPowerSupported = display_.DisplayPowerQuery();
    if (!app_.displayPowerSupported) offDisplay_->setEnabled(false);
    watch_.SetCardState(1);
    watchTimer_.setSingleShot(true);
    QObject::connect(&watchTimer_, &QTimer::timeout, this,
                     [this] { OnMessage(kWmTimer, kTimerCardWatch, 0); });
    watchTimer_.start(1000);
}

MainWindow::~MainWindow() {
    Shutdown();
    // The views are children, which the base widget would delete only after this window's
    // members are gone; a view joins its workers through the message layer and the card host,
    // so the views go first, last made first.
    for (auto record = views_.records.rbegin(); record != views_.records.rend(); ++record) {
        delete record->window;
        record->window = nullptr;
    }
    if (context_.messages == &messages_) context_.messages = nullptr;
    if (context_.mainWindow == this) context_.mainWindow = nullptr;
}

void MainWindow::BuildMenuBar() {
    menuBar_ = new QToolBar(this);
    menuBar_->setIconSize(QSize(18, 18));
    menuBar_->setMovable(false);
    menuBar_->setStyleSheet(
        "QToolBar { background: #dde3ec; border-top: 1px solid #9aa5b5; "
        "spacing: 0px; padding: 0px; } QToolButton { padding: 0px 1px; margin: 0px; }");

    auto* file = new QMenu("File", this);
    offDisplay_ = file->addAction("Off Display", this, [this] { Command(kCmdOffDisplay); });
    file->addAction("Exit", this, [this] { Command(kCmdExit); });
    // The view in front adds its own entries above the window's, for as long as the menu is open.
    QObject::connect(file, &QMenu::aboutToShow, this, [this, file] {
        for (QAction* action : file->actions()) {
            if (!action->property("viewEntry").toBool()) continue;
            file->removeAction(action);
            action->deleteLater();
        }
        View* view = ViewAt(views_.current);
        const std::vector<FileMenuEntry> entries =
            view ? view->FileMenuEntries() : std::vector<FileMenuEntry>{};
        QAction* before = file->actions().value(0);
        for (const FileMenuEntry& entry : entries) {
            auto* action = new QAction(QString::fromStdU16String(entry.text), file);
            action->setEnabled(entry.enabled);
            action->setProperty("viewEntry", true);
            const int id = entry.id;
            QObject::connect(action, &QAction::triggered, this, [this, id] { Command(id); });
            file->insertAction(before, action);
        }
        if (!entries.empty()) {
            QAction* separator = file->insertSeparator(before);
            separator->setProperty("viewEntry", true);
        }
    });
    fileMenu_ = file;
    auto* fileButton = new QToolButton(menuBar_);
    fileButton->setText("File");
    fileButton->setMenu(file);
    fileButton->setPopupMode(QToolButton::InstantPopup);
    menuBar_->addWidget(fileButton);

    auto* group = new QActionGroup(this);
    for (int i = 0; i < 6; ++i) {
        QAction* button =
            menuBar_->addAction(ViewButtonIcon(i), QString::fromStdU16String(kViewTable[i].title));
        button->setCheckable(true);
        button->setActionGroup(group);
        const int id = kCmdViewFirst + i;
        QObject::connect(button, &QAction::triggered, this, [this, id] { Command(id); });
        buttons_[i] = button;
    }
    buttons_[0]->setChecked(true);

    auto* help = new QMenu("Help", this);
    help->addAction("About", this, [this] { Command(kCmdAbout); });
    auto* helpButton = new QToolButton(menuBar_);
    helpButton->setText("Help");
    helpButton->setMenu(help);
    helpButton->setPopupMode(QToolButton::InstantPopup);
    menuBar_->addWidget(helpButton);

    // The keyboard belongs to the views: a menu-bar button never keeps the focus.
    for (QToolButton* button : menuBar_->findChildren<QToolButton*>())
        button->setFocusPolicy(Qt::NoFocus);

    trayMenu_ = new QMenu(this);
    trayMenu_->addAction("What's this?", this, [this] { Command(kCmdWhatsThis); });
    trayMenu_->addAction("Close Dialer", this, [this] { Command(kCmdExit); });
}

void MainWindow::CreateViews(std::array<ViewFactory, kViewCount>& factories) {
    QRect client = rect();
    client.setHeight(client.height() - kMenuBarHeight);
    for (int i = 0; i < kViewCount; ++i) {
        ViewRecord record;
        record.rect = client;
        record.className = kViewTable[i].className;
        record.windowProc = [this, factory = factories[i]](QWidget* parent) {
            return factory ? factory(parent, context_) : nullptr;
        };
        views_.records.push_back(std::move(record));
    }
    for (ViewRecord& record : views_.records)
        if (!CreateView(this, record)) break;
    menuBar_->raise();
    ShowView(views_);
}

View* MainWindow::ViewAt(int index) const {
    return index >= 0 && index < views_.Count() ? views_.records[index].window : nullptr;
}

long MainWindow::OnMessage(unsigned msg, long wParam, long lParam) {
    switch (msg) {
        case kWmCommand:
            OnCommand(static_cast<int>(wParam & 0xFFFF));
            return 0;
        case kWmTimer:
            if (wParam == kTimerCardWatch) OnWatchTimer();
            return 0;
        case kWmChar:
            if (wParam == 196) {
                app_.displayOff ? display_.DisplayOn() : display_.DisplayOff();
                app_.displayOff = !app_.displayOff;
            }
            return 0;
        case kWmActivate:
            if (app_.displayPowerSupported && (wParam & 0xFFFF) == kWaInactive && app_.displayOff) {
                display_.DisplayOn();
                app_.displayOff = 0;
            }
            if (View* settings = ViewAt(kViewSettings)) settings->OnMessage(msg, wParam, lParam);
            return 0;
        case kMsgTrayIcon:
            if (wParam == kTrayIconId && lParam == kWmLButtonDown) ShowTrayMenu();
            return 0;
        case kMsgRefreshLists:
            if (View* folder = ViewAt(kViewSmsFolder)) folder->OnMessage(msg, wParam, lParam);
            if (View* log = ViewAt(kViewCallLog)) log->OnMessage(msg, wParam, lParam);
            return 0;
        case kMsgCallActive:
        case kMsgCallListEmpty:
        case kMsgCallRinging:
            if (View* dialPad = ViewAt(kViewDialPad)) dialPad->OnMessage(msg, wParam, lParam);
            return 0;
        case kMsgCardSilent:
            if (app_.cardState == 2 && !shutDown_) {
                Log("card", u"silent: taken for gone");
                watch_.SetCardState(1);
            }
            return 0;
        case kMsgBringForward:
            Log("foreground", u"asked by a second start");
            Foreground();
            return 1;
        default:
            return 0;
    }
}

namespace {
constexpr int kExitHangUpLimitMs = 1000;
}  // namespace

void MainWindow::OnCommand(int id) {
    if (id >= kCmdViewFirst && id < kCmdViewFirst + 6) {
        SwitchView(views_, id - kCmdViewFirst);
        CheckViewButton(buttons_, views_.current);
        return;
    }
    switch (id) {
        case kCmdOffDisplay:
            if (!app_.displayOff && app_.displayPowerSupported) {
                display_.DisplayOff();
                app_.displayOff = 1;
            }
            break;
        case kCmdExit:
            if (card_.CompanionExists() && card_.SendCompanion(kMsgCardPowerQuery) == 1L) {
                // Neither a card that does not answer nor a dial holding the port holds up the
                // exit: closing the port ends the dial's wait.
                char reply[256];
                ExchangeOptions options;
                options.tryLock = true;
                options.answerLimitMs = kExitHangUpLimitMs;
                AtExchange(context_.link, "ATH\r", reply, sizeof reply, options);
            }
            Shutdown();
            break;
        case kCmdAbout:
            ShowAbout();
            break;
        case kCmdWhatsThis:
            MessageBox(
                u"Tavro Card Phone Dialer is opened, and no other applications can open "
                u"the communication port of Tavro Card Phone 2.0 now.",
                kBoxTitle, kMbTopmost);
            break;
        case kCmdNotificationTapped:
            Foreground();
            notifier_->Remove(kCmdNotificationTapped);
            CheckViewButton(buttons_, kViewDialPad);
            views_.current = kViewDialPad;
            ShowView(views_);
            if (View* dialPad = ViewAt(kViewDialPad))
                dialPad->OnMessage(kWmCommand, kCmdNotificationTapped, 0);
            break;
        default:
            // A control's command from outside (a script driving the dialer through its
            // socket) goes to the view in front, as the control's own click would.
            if (View* view = ViewAt(views_.current)) view->OnMessage(kWmCommand, id, 0);
            break;
    }
}

void MainWindow::OnWatchTimer() {
    watchTimer_.stop();
    watch_.Tick();
    if (!shutDown_) watchTimer_.start(1000);
}

void MainWindow::ShowTrayMenu() {
    Foreground();
    const QRect screen = this->screen() ? this->screen()->geometry() : QRect(0, 0, 240, 320);
    const QSize size = trayMenu_->sizeHint();
    trayMenu_->popup(QPoint(screen.right() + 1 - size.width(),
                            screen.bottom() + 1 - kMenuBarHeight - size.height()));
}

void MainWindow::ShowAbout() {
    QDialog about(this);
    about.setObjectName("ABOUT_DIALOG");
    about.setWindowTitle("About");
    auto* layout = new QVBoxLayout(&about);
    char16_t firmwareText[64] = {};
    float version = 0.0f;
    // A query of the card: run aside, so the window keeps painting while the card answers.
    RunAside([&] {
        version = GetFirmwareVersion(context_.link, firmwareText, 64);
        return 1;
    });
    auto* firmware = new QLabel(&about);
    SetControlId(firmware, kAboutFirmwareId);
    if (version != 0.0f) {
        char text[96];
        std::snprintf(text, sizeof text, "Tavro Card Phone 2.0 Firmware Version %1.2f", version);
        firmware->setText(text);
    }
    auto* program = new QLabel(
        QString::fromUtf16(u"Tavro Card Phone Dialer v 2.01 for\r\nPocket PC (build 060302)"),
        &about);
    SetControlId(program, kAboutProgramId);
    auto* buttons = new QDialogButtonBox(QDialogButtonBox::Ok, &about);
    QObject::connect(buttons, &QDialogButtonBox::accepted, &about, [&about] { about.done(1); });
    QObject::connect(buttons, &QDialogButtonBox::rejected, &about, [&about] { about.done(2); });
    layout->addWidget(new QLabel("<b>VQM Dialer</b>", &about));
    layout->addWidget(firmware);
    layout->addWidget(program);
    layout->addStretch();
    layout->addWidget(buttons);
    about.setGeometry(geometry());  // full screen over the dialer, as on the handheld
    context_.dialogs.Run(&about);
}

// WM_DESTROY: the card watch stops, the link closes (ending the listener, whose sends are
// still delivered meanwhile), and no worker is left waiting on a window that is gone.
void MainWindow::Shutdown() {
    if (shutDown_) return;
    shutDown_ = true;
    card_.StopWaiting();  // a wait for a card manager still powering up ends now
    watchTimer_.stop();
    if (app_.cardState == 2) card_.CloseLink();
    messages_.Close();
    context_.link.postToMain = nullptr;
    if (tray_) tray_->hide();
    hide();
    QMetaObject::invokeMethod(
        qApp, [] { QApplication::quit(); }, Qt::QueuedConnection);
}

// ShellUi

int MainWindow::MessageBox(const std::u16string& text, const std::u16string& title,
                           unsigned style) {
    const int answer = context_.dialogs.MessageBox(this, text, title, style);
    // The window the box stood over is the active one again, so the keyboard reaches it.
    if (isVisible()) activateWindow();
    return answer;
}

void MainWindow::ShowStatus(const std::u16string& first, const std::u16string& second) {
    View* dialPad = ViewAt(kViewDialPad);
    if (auto* line = qobject_cast<QLabel*>(FindControl(dialPad, kStatusFirstId)))
        line->setText(QString::fromStdU16String(first));
    // An empty second line is not shown: nothing of an earlier status stays under the first.
    if (auto* line = qobject_cast<QLabel*>(FindControl(dialPad, kStatusSecondId)))
        line->setText(QString::fromStdU16String(second));
    statusShownAt_ = std::chrono::steady_clock::now();
    // As the screen shows it: one line for each status line.
    Log("status", first);
    if (!second.empty()) Log("status", second);
}

void MainWindow::Log(std::string_view what, std::u16string_view text) {
    if (context_.uiLog) context_.uiLog->Line(what, text);
}

void MainWindow::Foreground() {
    show();
    setWindowState((windowState() & ~Qt::WindowMinimized) | Qt::WindowActive);
    raise();
    activateWindow();
}

void MainWindow::UpdateWindow() {
    repaint();
}

int MainWindow::RunAside(const std::function<int()>& work) {
    // The window keeps painting and taking the card's and the sockets' messages while the work
    // runs; a person's input waits, as the busy look says.
    QEventLoop loop;
    std::atomic<bool> done{false};
    int result = 0;
    busy_.BeginBusy();
    std::thread helper([&] {
        result = work();
        done = true;
        QMetaObject::invokeMethod(&loop, &QEventLoop::quit, Qt::QueuedConnection);
    });
    // An exit meanwhile ends the loop early; the work is bounded and is waited for all the same.
    if (!done.load()) loop.exec(QEventLoop::ExcludeUserInputEvents);
    helper.join();
    busy_.EndBusy();
    return result;
}

void MainWindow::SetBusyLook(bool busy) {
    auto apply = [this, busy] {
        setEnabled(!busy);
        if (busy)
            QApplication::setOverrideCursor(Qt::WaitCursor);
        else
            QApplication::restoreOverrideCursor();
    };
    if (messages_.OnOwnerThread())
        apply();
    else
        QMetaObject::invokeMethod(this, apply, Qt::QueuedConnection);
}

void MainWindow::SetTrayIcon(int icon) {
    trayIcon_ = icon;
    tray_->setIcon(ProgramIcon(icon));
}

void MainWindow::EnableViewButton(int index, bool enable) {
    if (enable)
        vqm::EnableViewButton(buttons_, index);
    else
        vqm::DisableViewButton(buttons_, index);
}

void MainWindow::ShowDialPad() {
    CheckViewButton(buttons_, kViewDialPad);
    views_.current = kViewDialPad;
    ShowView(views_);
}

void MainWindow::SendToViews(unsigned msg, long wParam, long lParam) {
    if (msg == kMsgCardStateChanged)
        Log("card", app_.cardState == 2 ? u"2 connected" : u"1 not connected");
    for (const ViewRecord& record : views_.records)
        if (record.window) record.window->OnMessage(msg, wParam, lParam);
}

// Events

void MainWindow::showEvent(QShowEvent* event) {
    QWidget::showEvent(event);
    if (!shownOnce_) Log("window", u"shown");
    shownOnce_ = true;
}

void MainWindow::paintEvent(QPaintEvent*) {
    QPainter painter(this);
    const QRect client = rect();
    const QString text =
        QString::asprintf("Window Rect: %d %d %d %d", client.left(), client.top(),
                          client.right() + 1, client.bottom() + 1 - kMenuBarHeight);
    painter.drawText(client, Qt::AlignHCenter | Qt::AlignVCenter | Qt::TextSingleLine, text);
}

void MainWindow::resizeEvent(QResizeEvent*) {
    QRect client = rect();
    client.setHeight(client.height() - kMenuBarHeight);
    for (ViewRecord& record : views_.records) {
        record.rect = client;
        if (record.window) record.window->setGeometry(client);
    }
    if (menuBar_) menuBar_->setGeometry(0, client.bottom() + 1, width(), kMenuBarHeight);
}

void MainWindow::keyPressEvent(QKeyEvent* event) {
    if (event->key() == kDisplayKey && app_.displayPowerSupported) {
        OnMessage(kWmChar, 196, 0);
        return;
    }
    QWidget::keyPressEvent(event);
}

void MainWindow::changeEvent(QEvent* event) {
    if (event->type() == QEvent::ActivationChange)
        OnMessage(kWmActivate, isActiveWindow() ? 1 : kWaInactive, 0);
    QWidget::changeEvent(event);
}

void MainWindow::closeEvent(QCloseEvent* event) {
    // Closing the window is Exit: hang up any call and stop.
    if (!shutDown_) Command(kCmdExit);
    event->accept();
}

}  // namespace vqm
