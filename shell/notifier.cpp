#include "shell/notifier.h"

#include <QDBusConnection>
#include <QDBusConnectionInterface>
#include <QDBusMessage>
#include <QDBusReply>
#include <QVariantMap>
#include <cstdio>

namespace vqm {

namespace {
const QString kService = QStringLiteral("org.freedesktop.Notifications");
const QString kPath = QStringLiteral("/org/freedesktop/Notifications");
const QString kInterface = QStringLiteral("org.freedesktop.Notifications");
const QString kAction = QStringLiteral("default");
}  // namespace

QString NotificationBody(const QString& text, bool serviceReadsMarkup) {
    if (!serviceReadsMarkup) return text;
    QString escaped;
    escaped.reserve(text.size());
    for (QChar c : text) {
        if (c == u'&')
            escaped += QStringLiteral("&amp;");
        else if (c == u'<')
            escaped += QStringLiteral("&lt;");
        else if (c == u'>')
            escaped += QStringLiteral("&gt;");
        else
            escaped += c;
    }
    return escaped;
}

Notifier::Notifier(std::function<void(int)> onAction, QObject* parent)
    : QObject(parent), onAction_(std::move(onAction)) {
    QDBusConnection bus = QDBusConnection::sessionBus();
    available_ = bus.isConnected();
    if (!available_) return;
    bus.connect(kService, kPath, kInterface, QStringLiteral("ActionInvoked"), this,
                SLOT(OnActionInvoked(uint, QString)));
    bus.connect(kService, kPath, kInterface, QStringLiteral("NotificationClosed"), this,
                SLOT(OnClosed(uint, uint)));
}

void Notifier::Post(int id, const QString& body, const QString& soundFile) {
    if (available_ && readsMarkup_ < 0) {
        QDBusReply<QStringList> capabilities = QDBusConnection::sessionBus().call(
            QDBusMessage::createMethodCall(kService, kPath, kInterface,
                                           QStringLiteral("GetCapabilities")),
            QDBus::Block, 2000);
        // A service that does not answer is asked again next time; meanwhile escaping is the
        // safe guess, as most services read markup.
        if (capabilities.isValid())
            readsMarkup_ = capabilities.value().contains(QStringLiteral("body-markup")) ? 1 : 0;
    }
    if (available_) {
        QDBusMessage call =
            QDBusMessage::createMethodCall(kService, kPath, kInterface, QStringLiteral("Notify"));
        QVariantMap hints;
        if (!soundFile.isEmpty()) hints[QStringLiteral("sound-file")] = soundFile;
        const auto known = serverIds_.find(id);
        call << QStringLiteral("VQM Dialer") << (known == serverIds_.end() ? 0u : known->second)
             << QString() << QStringLiteral("VQM Dialer")
             << NotificationBody(body, readsMarkup_ != 0)
             << QStringList{kAction, QStringLiteral("Open DialPad")} << hints << int(-1);
        QDBusReply<uint> reply = QDBusConnection::sessionBus().call(call, QDBus::Block, 2000);
        if (reply.isValid()) {
            serverIds_[id] = reply.value();
            return;
        }
    }
    if (!warned_) {
        std::fprintf(stderr,
                     "vqm-dialer: no desktop notification service; alerts show in the "
                     "window only\n");
        warned_ = true;
    }
}

void Notifier::Remove(int id) {
    const auto known = serverIds_.find(id);
    if (known == serverIds_.end()) return;
    const uint serverId = known->second;
    serverIds_.erase(known);
    if (!available_) return;
    QDBusMessage call = QDBusMessage::createMethodCall(kService, kPath, kInterface,
                                                       QStringLiteral("CloseNotification"));
    call << serverId;
    QDBusConnection::sessionBus().call(call, QDBus::NoBlock);
}

void Notifier::OnActionInvoked(uint serverId, const QString& action) {
    if (action != kAction) return;
    for (const auto& [id, known] : serverIds_)
        if (known == serverId) {
            if (onAction_) onAction_(id);
            return;
        }
}

void Notifier::OnClosed(uint serverId, uint) {
    for (auto it = serverIds_.begin(); it != serverIds_.end(); ++it)
        if (it->second == serverId) {
            serverIds_.erase(it);
            return;
        }
}

}  // namespace vqm
