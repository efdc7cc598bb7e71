// Desktop notifications (freedesktop, over the session bus) titled "VQM Dialer". A
// notification carries an id of the program's own choosing (2002 for new messages); tapping
// its action calls the handler with that id, and removing by id closes it. Without a session
// bus or a notification service, posting does nothing and says so once on stderr.
#pragma once

#include <QObject>
#include <QString>
#include <functional>
#include <map>

namespace vqm {

// The body as a notification service shows it: one that reads body markup gets &, < and >
// escaped, so that a sender's "<b>" shows as typed; one that does not gets the text as it is.
QString NotificationBody(const QString& text, bool serviceReadsMarkup);

class Notifier : public QObject {
    Q_OBJECT
  public:
    explicit Notifier(std::function<void(int id)> onAction, QObject* parent = nullptr);

    // Posts or replaces the notification with this id. body is plain text; soundFile may be
    // empty.
    void Post(int id, const QString& body, const QString& soundFile = {});
    void Remove(int id);
    bool Available() const { return available_; }

  private slots:
    void OnActionInvoked(uint serverId, const QString& action);
    void OnClosed(uint serverId, uint reason);

  private:
    std::function<void(int)> onAction_;
    std::map<int, uint> serverIds_;  // our id -> the service's id
    bool available_ = false;
    int readsMarkup_ = -1;  // the service's "body-markup" capability; -1 not asked yet
    bool warned_ = false;
};

}  // namespace vqm
