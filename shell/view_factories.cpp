#include "shell/view_factories.h"

#include <QLabel>
#include <QVBoxLayout>

#include "calls/call_log_view.h"

namespace vqm {

namespace {

// Until the dial pad proper is built in, the status lines are what the DialPad shows.
class StatusView : public View {
  public:
    explicit StatusView(QWidget* parent) : View(parent) {
        auto* layout = new QVBoxLayout(this);
        layout->addStretch();
        for (int id : {kStatusFirstId, kStatusSecondId}) {
            auto* line = new QLabel(this);
            line->setAlignment(Qt::AlignCenter);
            line->setStyleSheet("color: #404040; font-size: 13px;");
            SetControlId(line, id);
            layout->addWidget(line);
        }
        layout->addStretch();
    }
};

}  // namespace

std::array<ViewFactory, kViewCount> DefaultViewFactories() {
    std::array<ViewFactory, kViewCount> factories;
    factories[kViewDialPad] = [](QWidget* parent, ShellContext&) { return new StatusView(parent); };
    for (int i = 1; i < kViewCount; ++i)
        factories[i] = [](QWidget* parent, ShellContext&) { return new View(parent); };
    factories[kViewCallLog] = CreateCallLogView;
    return factories;
}

}  // namespace vqm
