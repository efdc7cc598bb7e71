// The Write SMS view (WRITESMS_VIEW, view 1): the recipients field with the button that opens
// the contact picker, the message text with its counter, and Send, Save To Draft and Clear All.
// The decisions are write_sms.h's; the send runs on a worker thread of the view's, so the window
// keeps painting while the card takes each message, and the result comes back as a message.
#pragma once

#include <QPlainTextEdit>
#include <functional>
#include <memory>
#include <mutex>
#include <string>
#include <vector>

#include "calls/card_worker.h"
#include "messaging/message_store.h"
#include "messaging/write_handoff.h"
#include "messaging/write_sms.h"
#include "shell/main_window.h"
#include "shell/views.h"

class QLabel;
class QPushButton;

namespace vqm {

// Controls of the view.
inline constexpr int kWritePickerId = 1002, kWriteSendId = 1003, kWriteDraftId = 1004,
                     kWriteClearId = 1005, kWriteRecipientsId = 1006, kWriteTextId = 1007,
                     kWriteCounterId = 1008;
// The line that says how a send is going.
inline constexpr int kWriteStatusId = 1009;

// A text box whose limit stops what a person types or pastes beyond it, while text the
// program puts in (a forwarded message) stays whole, so the counter can say it is too long.
class LimitedTextEdit : public QPlainTextEdit {
  public:
    explicit LimitedTextEdit(QWidget* parent) : QPlainTextEdit(parent) {}
    void SetLimit(int limit) { limit_ = limit; }
    int Limit() const { return limit_; }

  protected:
    void keyPressEvent(QKeyEvent* event) override;
    void insertFromMimeData(const QMimeData* source) override;

  private:
    int Room() const;
    int limit_ = kGsmLimit;
};

struct WriteViewHooks {
    // The store whose transfer file the SMS Folder files into its pages; the view keeps one of
    // its own when there is none (the copies then wait in the transfer file).
    std::function<MessageStore*()> store;
    // Brings the contact picker up.
    std::function<void()> showPicker;
};

class WriteSmsView : public View {
  public:
    WriteSmsView(QWidget* parent, ShellContext& context, WriteViewHooks hooks = {});
    ~WriteSmsView() override;

    long OnMessage(unsigned msg, long wParam, long lParam) override;

    // Requests from other views wait here until the view comes up.
    WriteHandoff& Handoff() { return handoff_; }
    // Fills the fields from a waiting request.
    void TakeRequest();

    void Send();
    void SaveToDraft();
    void ClearAll();
    void UpdateCounter();

    std::u16string Recipients() const;
    std::u16string Text() const;
    void SetRecipients(const std::u16string& text);
    void SetText(const std::u16string& text);
    bool Sending() const { return sending_; }
    // Waits for a send under way, delivering its reports meanwhile.
    void WaitForSend();
    LimitedTextEdit* RecipientsEdit() const { return recipients_; }
    LimitedTextEdit* TextEdit() const { return text_; }

  protected:
    void resizeEvent(QResizeEvent* event) override;

  private:
    MessageStore& Store();
    MessageLayer& Messages();
    void Relayout();
    void ShowStatus(const std::u16string& text);
    void FileSent();
    void SendDone();

    ShellContext& context_;
    WriteViewHooks hooks_;
    std::unique_ptr<MessageStore> ownStore_;
    std::unique_ptr<MessageLayer> ownMessages_;
    WriteHandoff handoff_;
    QPushButton* picker_ = nullptr;
    QPushButton* send_ = nullptr;
    QPushButton* draft_ = nullptr;
    QPushButton* clear_ = nullptr;
    LimitedTextEdit* recipients_ = nullptr;
    LimitedTextEdit* text_ = nullptr;
    QLabel* counter_ = nullptr;
    QLabel* status_ = nullptr;
    bool sending_ = false;
    int recipientCount_ = 0;
    // What the worker hands back, under the mutex.
    std::mutex mutex_;
    std::vector<SmsRecord> sent_;
    SendOutcome outcome_;
    std::string attempting_;
    int attemptPlace_ = 0;
    // Last: its thread uses everything above, so it is stopped and joined first.
    CardWorker worker_;
};

// Hands a request to the program's Write SMS view and brings the view up (Reply, Forward,
// Manage Contacts' Write Message, the picker's OK). 0 when there is no such view.
int HandToWriteSms(ShellContext& context, WriteRequest request);

}  // namespace vqm
