#include "messaging/write_sms_view.h"

#include <QApplication>
#include <QKeyEvent>
#include <QLabel>
#include <QMetaObject>
#include <QMimeData>
#include <QPushButton>
#include <QResizeEvent>
#include <QTextCursor>

#include "shell/dialogs.h"
#include "shell/messages.h"
#include "shell/ui_log.h"
#include "support/text.h"

namespace vqm {

namespace {

// Messages of this view alone: the worker's reports.
constexpr unsigned kMsgWriteAttempt = 0x8201;  // a recipient is being sent to
constexpr unsigned kMsgWriteFile = 0x8202;     // the card took a message: file it as sent
constexpr unsigned kMsgWriteDone = 0x8203;     // the walk ended

constexpr int kMargin = 4, kButtonHeight = 24, kRowGap = 4;

QString Q(const std::u16string& text) {
    return QString::fromStdU16String(text);
}
std::u16string U(const QString& text) {
    return text.toStdU16String();
}

}  // namespace

int LimitedTextEdit::Room() const {
    const int selected = static_cast<int>(textCursor().selectedText().size());
    return limit_ - (static_cast<int>(toPlainText().size()) - selected);
}

void LimitedTextEdit::keyPressEvent(QKeyEvent* event) {
    const QString typed = event->text();
    const bool adds =
        !typed.isEmpty() &&
        (typed.at(0).isPrint() || event->key() == Qt::Key_Return || event->key() == Qt::Key_Enter);
    if (adds && Room() < typed.size()) {
        QApplication::beep();
        return;
    }
    QPlainTextEdit::keyPressEvent(event);
}

void LimitedTextEdit::insertFromMimeData(const QMimeData* source) {
    if (!source || !source->hasText()) return;
    const int room = Room();
    if (room <= 0) {
        QApplication::beep();
        return;
    }
    insertPlainText(source->text().left(room));
}

WriteSmsView::WriteSmsView(QWidget* parent, ShellContext& context, WriteViewHooks hooks)
    : View(parent), context_(context), hooks_(std::move(hooks)) {
    if (parent)
        resize(parent->width(), parent->height() - kMenuBarHeight);
    else
        resize(240, 320 - kMenuBarHeight);

    auto button = [this](const char* label, int id, auto action) {
        auto* b = new QPushButton(label, this);
        SetControlId(b, id);
        b->setFocusPolicy(Qt::TabFocus);
        QObject::connect(b, &QPushButton::clicked, this, action);
        return b;
    };
    picker_ = button("To:", kWritePickerId, [this] {
        if (hooks_.showPicker) hooks_.showPicker();
    });
    send_ = button("Send", kWriteSendId, [this] { Send(); });
    draft_ = button("Save To Draft", kWriteDraftId, [this] { SaveToDraft(); });
    clear_ = button("Clear All", kWriteClearId, [this] { ClearAll(); });

    recipients_ = new LimitedTextEdit(this);
    SetControlId(recipients_, kWriteRecipientsId);
    // A send reads this much of the field: no more can be typed. Entries the picker or another
    // view adds stay whole, and Send refuses what runs past it.
    recipients_->SetLimit(static_cast<int>(kRecipientsReadLimit));
    recipients_->setTabChangesFocus(true);
    text_ = new LimitedTextEdit(this);
    SetControlId(text_, kWriteTextId);
    text_->setTabChangesFocus(true);
    counter_ = new QLabel("0/160", this);
    SetControlId(counter_, kWriteCounterId);
    counter_->setAlignment(Qt::AlignRight | Qt::AlignVCenter);
    status_ = new QLabel(this);
    SetControlId(status_, kWriteStatusId);
    status_->setTextFormat(Qt::PlainText);  // it names the recipient's number as typed
    QObject::connect(text_, &QPlainTextEdit::textChanged, this, [this] { UpdateCounter(); });

    Relayout();
    Messages();  // made on the view's thread, which owns it
}

WriteSmsView::~WriteSmsView() {
    // A send still going finishes its exchange; its reports are refused from here on.
    worker_.Stop();
    Messages().Close();
    Messages().WaitWhileDelivering([this] { return worker_.Idle(); });
    worker_.Join();
}

// The worker reports through a layer of the view's own, which lives exactly as long as the
// view: a send that ends while the program closes never posts into a window already gone.
MessageLayer& WriteSmsView::Messages() {
    if (!ownMessages_)
        ownMessages_ = std::make_unique<MessageLayer>([this] {
            QMetaObject::invokeMethod(
                this, [this] { ownMessages_->DeliverPending(); }, Qt::QueuedConnection);
        });
    return *ownMessages_;
}

MessageStore& WriteSmsView::Store() {
    if (hooks_.store)
        if (MessageStore* store = hooks_.store()) return *store;
    if (!ownStore_) {
        ownStore_ = std::make_unique<MessageStore>(context_.settings);
        StoreGuardCreate(*ownStore_);
    }
    return *ownStore_;
}

void WriteSmsView::Relayout() {
    const int w = width(), h = height();
    const int inner = std::max(0, w - 2 * kMargin);
    const int pickerWidth = 44;
    const int recipientsHeight = 48;
    picker_->setGeometry(kMargin, kMargin, pickerWidth, kButtonHeight);
    recipients_->setGeometry(kMargin + pickerWidth + 4, kMargin,
                             std::max(0, inner - pickerWidth - 4), recipientsHeight);
    const int buttonsTop = h - kMargin - kButtonHeight;
    const int counterTop = buttonsTop - kRowGap - 18;
    const int textTop = kMargin + recipientsHeight + kRowGap;
    text_->setGeometry(kMargin, textTop, inner, std::max(0, counterTop - kRowGap - textTop));
    status_->setGeometry(kMargin, counterTop, inner / 2, 18);
    counter_->setGeometry(kMargin + inner / 2, counterTop, inner - inner / 2, 18);
    const int sendWidth = inner * 26 / 100, draftWidth = inner * 40 / 100;
    const int clearWidth = inner - sendWidth - draftWidth - 8;
    send_->setGeometry(kMargin, buttonsTop, sendWidth, kButtonHeight);
    draft_->setGeometry(kMargin + sendWidth + 4, buttonsTop, draftWidth, kButtonHeight);
    clear_->setGeometry(kMargin + sendWidth + draftWidth + 8, buttonsTop, clearWidth,
                        kButtonHeight);
}

void WriteSmsView::resizeEvent(QResizeEvent* event) {
    View::resizeEvent(event);
    Relayout();
}

std::u16string WriteSmsView::Recipients() const {
    return U(recipients_->toPlainText());
}

std::u16string WriteSmsView::Text() const {
    return U(text_->toPlainText());
}

void WriteSmsView::SetRecipients(const std::u16string& text) {
    // A text box breaks lines at "\n" alone; the pieces' "\r" would show as a blank.
    QString shown = Q(text);
    shown.remove(QChar(u'\r'));
    recipients_->setPlainText(shown);
    recipients_->moveCursor(QTextCursor::End);
}

void WriteSmsView::SetText(const std::u16string& text) {
    text_->setPlainText(Q(text));
    text_->moveCursor(QTextCursor::End);
    UpdateCounter();
}

void WriteSmsView::UpdateCounter() {
    const MessageCount count = CountMessage(Text());
    counter_->setText(Q(CounterText(count)));
    text_->SetLimit(count.limit);
}

void WriteSmsView::ShowStatus(const std::u16string& text) {
    status_->setText(Q(text));
    if (context_.uiLog && context_.uiLog->Enabled() && !text.empty())
        context_.uiLog->Line("write-status", text);
}

void WriteSmsView::TakeRequest() {
    std::optional<WriteRequest> request = handoff_.Take();
    if (!request) return;
    WriteFields fields{Recipients(), Text()};
    ApplyWriteRequest(*request, &fields);
    SetRecipients(fields.recipients);
    if (fields.text != Text()) SetText(fields.text);
}

void WriteSmsView::ClearAll() {
    recipients_->clear();
    text_->clear();
    text_->setFocus();
    UpdateCounter();
}

void WriteSmsView::Send() {
    if (sending_) return;
    PreparedSend prepared;
    const auto ask = [this](const std::u16string& question) {
        return context_.dialogs.MessageBox(this, question, kErrorTitle,
                                           kMbOkCancel | kMbIconStop | kMbTopmost) == kIdOk;
    };
    if (!PrepareSend(Recipients(), Text(), ask, &prepared)) {
        if (!prepared.refusal.empty())
            context_.dialogs.MessageBox(this, prepared.refusal, kErrorTitle,
                                        kMbOk | kMbIconStop | kMbTopmost);
        return;
    }
    if (prepared.recipients.count > 0) SetRecipients(prepared.recipients.display);

    sending_ = true;
    recipientCount_ = prepared.recipients.count;
    send_->setEnabled(false);
    if (context_.mainWindow) context_.mainWindow->Busy().BeginBusy();
    ShowStatus(u"Sending...");
    MessageLayer* messages = &Messages();
    worker_.Post([this, messages, prepared] {
        SendHooks hooks;
        hooks.attempt = [this, messages](int place, const std::string& number) {
            {
                std::lock_guard<std::mutex> lock(mutex_);
                attempting_ = number;
                attemptPlace_ = place;
            }
            messages->Post(this, kMsgWriteAttempt, 0, 0);
        };
        hooks.sent = [this, messages](const SmsRecord& record) {
            {
                std::lock_guard<std::mutex> lock(mutex_);
                sent_.push_back(record);
            }
            messages->Post(this, kMsgWriteFile, 0, 0);
        };
        const SendOutcome outcome =
            SendToRecipients(context_.link, prepared.body, prepared.recipients, hooks);
        {
            std::lock_guard<std::mutex> lock(mutex_);
            outcome_ = outcome;
        }
        messages->Post(this, kMsgWriteDone, 0, 0);
    });
}

void WriteSmsView::FileSent() {
    std::vector<SmsRecord> sent;
    {
        std::lock_guard<std::mutex> lock(mutex_);
        sent.swap(sent_);
    }
    for (const SmsRecord& record : sent)
        ClipboardCopyRecord(Store(), record);
}

void WriteSmsView::SendDone() {
    FileSent();  // reports arrive in order; this only guards against a lost one
    SendOutcome outcome;
    {
        std::lock_guard<std::mutex> lock(mutex_);
        outcome = outcome_;
    }
    sending_ = false;
    send_->setEnabled(true);
    ShowStatus(u"");
    if (context_.mainWindow) context_.mainWindow->Busy().EndBusy();
    const SendBox box = SendEndBox(outcome);
    if (!box.text.empty()) context_.dialogs.MessageBox(this, box.text, box.title, box.style);
}

void WriteSmsView::WaitForSend() {
    Messages().WaitWhileDelivering([this] { return worker_.Idle(); });
    Messages().DeliverPending();
}

void WriteSmsView::SaveToDraft() {
    if (!SaveDraft(Store(), Text())) return;
    context_.dialogs.MessageBox(this, kDraftSavedText, kBoxTitle, kMbOk | kMbTopmost);
}

long WriteSmsView::OnMessage(unsigned msg, long, long) {
    switch (msg) {
        case kMsgViewShown:
            TakeRequest();
            if (recipients_->toPlainText().isEmpty())
                recipients_->setFocus();
            else
                text_->setFocus();
            break;
        case kMsgWriteAttempt: {
            std::string number;
            int place = 0;
            {
                std::lock_guard<std::mutex> lock(mutex_);
                number = attempting_;
                place = attemptPlace_;
            }
            ShowStatus(u"Sending to " + Utf8ToUtf16(number) + u" (" +
                       Utf8ToUtf16(std::to_string(place + 1)) + u" of " +
                       Utf8ToUtf16(std::to_string(recipientCount_)) + u")...");
            break;
        }
        case kMsgWriteFile:
            FileSent();
            break;
        case kMsgWriteDone:
            SendDone();
            break;
        default:
            break;
    }
    return 0;
}

int HandToWriteSms(ShellContext& context, WriteRequest request) {
    if (!context.mainWindow) return 0;
    auto* view = dynamic_cast<WriteSmsView*>(context.mainWindow->ViewAt(kViewWriteSms));
    if (!view) return 0;
    view->Handoff().Hand(std::move(request));
    if (context.mainWindow->Views().current == kViewWriteSms)
        view->TakeRequest();  // already up: no 2025 comes
    else
        context.mainWindow->Command(kCmdViewFirst + kViewWriteSms);
    return 1;
}

}  // namespace vqm
