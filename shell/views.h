// The views table: full-size child windows of which one is visible, switched by the menu-bar
// buttons, and the same records and rules for the pages of a tabbed view.
#pragma once

#include <QRect>
#include <QWidget>
#include <array>
#include <functional>
#include <string>
#include <vector>

#include "shell/message_layer.h"

class QAction;
class QTabBar;

namespace vqm {

// Controls carry the numeric id the views address them by.
void SetControlId(QWidget* control, int id);
int ControlId(const QWidget* control);
QWidget* FindControl(QWidget* root, int id);

// An entry a view adds to the main window's File menu while it is in front; choosing it sends
// the view the command id as a WM_COMMAND.
struct FileMenuEntry {
    std::u16string text;
    int id = 0;
    bool enabled = true;
};

// A view or page: a widget that answers window messages. Its object name is its class name.
class View : public QWidget, public MessageTarget {
  public:
    explicit View(QWidget* parent) : QWidget(parent) {}
    long OnMessage(unsigned, long, long) override { return 0; }
    // Asked each time the File menu opens, so the entries follow the view's state.
    virtual std::vector<FileMenuEntry> FileMenuEntries() { return {}; }
};

struct ViewRecord {
    QWidget* parent = nullptr;
    View* window = nullptr;
    QRect rect;
    std::u16string caption;  // tab label; empty for top-level views
    std::string className;
    // Makes the view's window; a null result is a view that failed to come up.
    std::function<View*(QWidget* parent)> windowProc;
};

struct ViewSet {
    int current = 0;
    std::vector<ViewRecord> records;
    int Count() const { return static_cast<int>(records.size()); }
};

// The menu bar's six view buttons (commands 40001 to 40006).
using ViewButtons = std::array<QAction*, 6>;

int CreateView(QWidget* parent, ViewRecord& record);
// Shows the current view, hides the others and sends it 2025; an index outside the table
// changes nothing.
void ShowView(ViewSet& set);
// Makes index current and shows it, unless it is current already (no second 2025).
void SwitchView(ViewSet& set, int index);
void CheckViewButton(const ViewButtons& buttons, int index);
void EnableViewButton(const ViewButtons& buttons, int index);
void DisableViewButton(const ViewButtons& buttons, int index);
// A tab strip 26 pixels high along the bottom of rect, one tab per record, and the pages
// above it; tapping a tab switches pages. Returns the number of pages created.
int CreateTabbedPages(QWidget* parent, int tabId, ViewSet& set, QRect rect);
// Fits the titles of the tab strip tabId under parent into the strip's width, whole, rather
// than scroll or cut the last (three titles share the 240-pixel screen).
void FitTabTitles(QWidget* parent, int tabId);
void GetViewRect(const ViewSet& set, QRect* rect);

}  // namespace vqm
