// The main window: the frame of the seven views, the menu bar with the view buttons and the
// File and Help menus, the tray icon, the card watch's timer and the display key.
#pragma once

#include <QSystemTrayIcon>
#include <QTimer>
#include <QWidget>
#include <array>
#include <chrono>
#include <functional>
#include <memory>
#include <string_view>

#include "shell/card_watch.h"
#include "shell/display_power.h"
#include "shell/message_layer.h"
#include "shell/views.h"

class QMenu;
class QToolBar;

namespace vqm {

struct Link;
class Dialogs;
class Notifier;
class SettingsStore;
class UiLog;
struct CallLog;
struct PhonebookCaches;
struct CallLog;
struct PhonebookCaches;

inline constexpr int kViewCount = 7;
// The DialPad's two status lines (labels), which the card watch writes through ShowStatus.
inline constexpr int kStatusFirstId = 1144, kStatusSecondId = 1145;
inline constexpr int kViewDialPad = 0, kViewWriteSms = 1, kViewSmsFolder = 2,
                     kViewManageContacts = 3, kViewSettings = 4, kViewCallLog = 5,
                     kViewContacts = 6;
// The key that stands in for the handheld's display key: it switches the display off and on
// while the dialer's window is active.
inline constexpr Qt::Key kDisplayKey = Qt::Key_F9;

// Everything the main window and the views share, made once by the program.
struct ShellContext {
    SettingsStore& settings;
    Link& link;
    Dialogs& dialogs;
    std::string runtimeRoot;
    UiLog* uiLog = nullptr;  // what the window shows, recorded when the program asks
    // The call logs and phonebook caches that every view shares: their locks guard only when
    // all readers and writers go through the same objects. A view given none makes its own.
    CallLog* callLog = nullptr;
    PhonebookCaches* caches = nullptr;
    MessageLayer* messages = nullptr;  // set by the main window
    class MainWindow* mainWindow = nullptr;
};

using ViewFactory = std::function<View*(QWidget* parent, ShellContext& context)>;

class MainWindow : public QWidget, public MessageTarget, public ShellUi {
  public:
    // card may be given by tests; otherwise the window talks to the card manager's socket.
    MainWindow(ShellContext& context, std::array<ViewFactory, kViewCount> factories,
               CardHost* card = nullptr);
    ~MainWindow() override;

    long OnMessage(unsigned msg, long wParam, long lParam) override;
    // The same as a WM_COMMAND with the id in the low word.
    void Command(int id) { OnMessage(273, id, 0); }

    // ShellUi
    int MessageBox(const std::u16string& text, const std::u16string& title,
                   unsigned style) override;
    void ShowStatus(const std::u16string& first, const std::u16string& second) override;
    void Foreground() override;
    void UpdateWindow() override;
    void SetBusyLook(bool busy) override;
    void SetTrayIcon(int icon) override;
    void EnableViewButton(int index, bool enable) override;
    void ShowDialPad() override;
    void SendToViews(unsigned msg, long wParam, long lParam) override;
    int RunAside(const std::function<int()>& work) override;
    bool ShuttingDown() const override { return shutDown_; }

    AppState& App() { return app_; }
    ViewSet& Views() { return views_; }
    const ViewButtons& Buttons() const { return buttons_; }
    MessageLayer& Messages() { return messages_; }
    BusyIndicator& Busy() { return busy_; }
    CardWatch& Watch() { return watch_; }
    Notifier& Notifications() { return *notifier_; }
    int TrayIconId() const { return trayIcon_; }
    // When ShowStatus last ran.
    std::chrono::steady_clock::time_point StatusShownAt() const { return statusShownAt_; }
    View* ViewAt(int index) const;
    QMenu* FileMenu() const { return fileMenu_; }
    // Stops the card watch's timer (tests drive the watch by hand).
    void StopWatchTimer() { watchTimer_.stop(); }

  protected:
    void paintEvent(QPaintEvent* event) override;
    void resizeEvent(QResizeEvent* event) override;
    void keyPressEvent(QKeyEvent* event) override;
    void changeEvent(QEvent* event) override;
    void closeEvent(QCloseEvent* event) override;
    void showEvent(QShowEvent* event) override;

  private:
    void BuildMenuBar();
    void CreateViews(std::array<ViewFactory, kViewCount>& factories);
    void OnCommand(int id);
    void OnWatchTimer();
    void ShowTrayMenu();
    void ShowAbout();
    void Shutdown();
    void Log(std::string_view what, std::u16string_view text);

    ShellContext& context_;
    MessageLayer messages_;
    AppState app_;
    std::unique_ptr<CardHost> ownCardHost_;
    CardHost& card_;
    BusyIndicator busy_{*this};
    CardWatch watch_;
    DisplayPower display_;
    ViewSet views_;
    ViewButtons buttons_{};
    QToolBar* menuBar_ = nullptr;
    QAction* offDisplay_ = nullptr;
    QMenu* fileMenu_ = nullptr;
    QMenu* trayMenu_ = nullptr;
    QSystemTrayIcon* tray_ = nullptr;
    int trayIcon_ = 0;
    Notifier* notifier_ = nullptr;
    QTimer watchTimer_;
    std::chrono::steady_clock::time_point statusShownAt_{};
    bool shutDown_ = false;
    bool shownOnce_ = false;
};

}  // namespace vqm
