// The Call Waiting page of the Settings view (SETTINGS_CALLWAITING_PAGE): the network's call
// waiting for voice calls, shown in a read-only field ("Unknown", "ACTIVE", "NOT ACTIVE") and
// asked for or changed with three buttons. The exchanges run on the page's own worker; the
// window hears of each result as a message and keeps painting meanwhile.
#pragma once

#include <memory>

#include "calls/card_worker.h"
#include "shell/main_window.h"
#include "shell/views.h"

class QLineEdit;

namespace vqm {

inline constexpr int kWaitingStateId = 1190, kWaitingRequestId = 1191, kWaitingActivateId = 1192,
                     kWaitingDeactivateId = 1193;
// The worker's report: wParam the request (one of the three button ids), lParam its result.
inline constexpr unsigned kMsgWaitingResult = 0x8201;

class CallWaitingPage : public View {
  public:
    CallWaitingPage(QWidget* parent, ShellContext& context);
    ~CallWaitingPage() override;

    // WM_COMMAND with a button id, the worker's result, the card state (2026).
    long OnMessage(unsigned msg, long wParam, long lParam) override;
    // An exchange is under way (the buttons are grey meanwhile).
    bool Busy() const { return busy_; }

  private:
    void Start(int id);
    void Finished(int id, int result);
    void SetState(const char16_t* text);
    void EnableButtons(bool enable);
    MessageLayer& Messages();

    ShellContext& context_;
    QLineEdit* state_ = nullptr;
    std::unique_ptr<MessageLayer> ownMessages_;
    bool busy_ = false;
    CardWorker worker_;  // last: its jobs post back to everything above
};

}  // namespace vqm
