#include "settings/call_waiting_page.h"

#include <QLabel>
#include <QLineEdit>
#include <QMetaObject>
#include <QPushButton>

#include "link/link.h"
#include "settings/call_waiting_at.h"
#include "shell/dialogs.h"
#include "shell/messages.h"

namespace vqm {

namespace {

constexpr int kMargin = 10, kRowHeight = 20, kButtonGap = 25;

}  // namespace

CallWaitingPage::CallWaitingPage(QWidget* parent, ShellContext& context)
    : View(parent), context_(context) {
    setObjectName("SETTINGS_CALLWAITING_PAGE");
    const int width = (parent ? parent->width() : 240) - 2 * kMargin;

    auto* title = new QLabel("Voice Call Waiting:", this);
    title->setGeometry(kMargin, kMargin, width, 16);
    auto* label = new QLabel("Status:", this);
    label->setGeometry(kMargin, kMargin + 30, 60, kRowHeight);
    state_ = new QLineEdit(this);
    SetControlId(state_, kWaitingStateId);
    state_->setReadOnly(true);
    state_->setGeometry(kMargin + 60, kMargin + 30, width - 60, kRowHeight);
    SetState(u"Unknown");

    const struct {
        int id;
        const char* text;
    } buttons[] = {{kWaitingRequestId, "Request Call Waiting"},
                   {kWaitingActivateId, "Activate Call Waiting"},
                   {kWaitingDeactivateId, "Deactivate Call Waiting"}};
    int y = kMargin + 70;
    for (const auto& b : buttons) {
        auto* button = new QPushButton(b.text, this);
        SetControlId(button, b.id);
        button->setGeometry(kMargin, y, width, kRowHeight);
        QObject::connect(button, &QPushButton::clicked, this,
                         [this, id = b.id] { OnMessage(kWmCommand, id, 0); });
        y += kButtonGap;
    }
}

CallWaitingPage::~CallWaitingPage() {
    // A running exchange finishes (a closed port ends it at once); its result is delivered
    // while the page is still here.
    worker_.Stop();
    Messages().WaitWhileDelivering([this] { return worker_.Idle(); });
    worker_.Join();
}

MessageLayer& CallWaitingPage::Messages() {
    if (context_.messages) return *context_.messages;
    if (!ownMessages_)
        ownMessages_ = std::make_unique<MessageLayer>([this] {
            QMetaObject::invokeMethod(
                this, [this] { ownMessages_->DeliverPending(); }, Qt::QueuedConnection);
        });
    return *ownMessages_;
}

long CallWaitingPage::OnMessage(unsigned msg, long wParam, long lParam) {
    switch (msg) {
        case kWmCommand: {
            const int id = static_cast<int>(wParam & 0xFFFF);
            if (id == kWaitingRequestId || id == kWaitingActivateId || id == kWaitingDeactivateId)
                Start(id);
            return 0;
        }
        case kMsgWaitingResult:
            Finished(static_cast<int>(wParam), static_cast<int>(lParam));
            return 0;
        case kMsgCardStateChanged: {
            const long state = context_.mainWindow ? context_.mainWindow->App().cardState : wParam;
            // What the page showed was the network's answer through that card.
            if (state != 2) SetState(u"Unknown");
            return 0;
        }
        default:
            return 0;
    }
}

void CallWaitingPage::Start(int id) {
    if (busy_) return;
    busy_ = true;
    EnableButtons(false);
    MessageLayer* messages = &Messages();
    Link* link = &context_.link;
    worker_.Post([this, messages, link, id] {
        int result = -1;
        if (id == kWaitingRequestId)
            result = QueryCallWaiting(*link);
        else
            result = SetCallWaiting(*link, id == kWaitingActivateId ? 1 : 0);
        messages->Post(this, kMsgWaitingResult, id, result);
    });
}

void CallWaitingPage::Finished(int id, int result) {
    busy_ = false;
    EnableButtons(true);
    const char16_t* failure = nullptr;
    if (id == kWaitingRequestId) {
        if (result == kWaitingActive) SetState(u"ACTIVE");
        if (result == kWaitingNotActive) SetState(u"NOT ACTIVE");
        if (result == kWaitingUnknown) {
            SetState(u"Unknown");
            failure = u"Cannot read call waiting from the network.";
        }
    } else if (result == 0) {
        SetState(id == kWaitingActivateId ? u"ACTIVE" : u"NOT ACTIVE");
    } else {
        // The network's setting is whatever it was; the field keeps what it last knew.
        failure = id == kWaitingActivateId ? u"Cannot activate call waiting."
                                           : u"Cannot deactivate call waiting.";
    }
    if (failure)
        context_.dialogs.MessageBox(this, failure, kBoxTitle,
                                    kMbOk | kMbIconExclamation | kMbTopmost);
}

void CallWaitingPage::SetState(const char16_t* text) {
    state_->setText(QString::fromStdU16String(text));
}

void CallWaitingPage::EnableButtons(bool enable) {
    for (int id : {kWaitingRequestId, kWaitingActivateId, kWaitingDeactivateId})
        if (QWidget* button = FindControl(this, id)) button->setEnabled(enable);
}

}  // namespace vqm
