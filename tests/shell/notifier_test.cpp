// Desktop notifications against a notification service on a private session bus: what the
// dialer posts, the action that brings the DialPad forward, and removal by id.
#include <gtest/gtest.h>
#include <signal.h>
#include <sys/wait.h>
#include <unistd.h>

#include <QApplication>
#include <QDBusConnection>
#include <QDBusMessage>
#include <QThread>
#include <QVariantMap>
#include <atomic>
#include <cstdio>
#include <mutex>
#include <string>
#include <vector>

#include "shell/notifier.h"
#include "tests/common/wait.h"

namespace vqm {
namespace {

// Plays the desktop's notification service on its own thread, so that the dialer's blocking
// call finds it answering.
class FakeNotificationService : public QObject {
    Q_OBJECT
    Q_CLASSINFO("D-Bus Interface", "org.freedesktop.Notifications")
  public:
    struct Posted {
        QString app, summary, body;
        QStringList actions;
        uint replaces;
    };

  public slots:
    uint Notify(const QString& app, uint replaces, const QString&, const QString& summary,
                const QString& body, const QStringList& actions, const QVariantMap&, int) {
        std::lock_guard<std::mutex> lock(mutex);
        posted.push_back({app, summary, body, actions, replaces});
        return replaces ? replaces : ++lastId;
    }
    QStringList GetCapabilities() {
        std::lock_guard<std::mutex> lock(mutex);
        ++capabilityQueries;
        return capabilities;
    }
    void CloseNotification(uint id) {
        std::lock_guard<std::mutex> lock(mutex);
        closed.push_back(id);
    }

  public:
    std::mutex mutex;
    std::vector<Posted> posted;
    std::vector<uint> closed;
    uint lastId = 40;
    QStringList capabilities{"actions", "body", "body-markup"};
    int capabilityQueries = 0;
};

class NotifierTest : public ::testing::Test {
  protected:
    void SetUp() override {
        if (qEnvironmentVariableIsEmpty("VQM_TEST_BUS")) GTEST_SKIP() << "no dbus-daemon";
        thread_.start();
        service_.moveToThread(&thread_);
        bus_ = std::make_unique<QDBusConnection>(QDBusConnection::connectToBus(
            QString::fromLocal8Bit(qgetenv("VQM_TEST_BUS")), "fake-service"));
        ASSERT_TRUE(bus_->isConnected());
        ASSERT_TRUE(bus_->registerObject("/org/freedesktop/Notifications", &service_,
                                         QDBusConnection::ExportAllSlots));
        ASSERT_TRUE(bus_->registerService("org.freedesktop.Notifications"));
    }
    void TearDown() override {
        if (bus_) {
            bus_->unregisterService("org.freedesktop.Notifications");
            bus_->unregisterObject("/org/freedesktop/Notifications");
        }
        bus_.reset();
        QDBusConnection::disconnectFromBus("fake-service");
        thread_.quit();
        thread_.wait();
    }
    // Lets the dialer's side take in what the service sent.
    template <typename Condition>
    bool Pump(Condition condition, std::chrono::milliseconds limit = std::chrono::seconds(5)) {
        return testing::WaitPumping(condition, limit);
    }
    std::vector<FakeNotificationService::Posted> Posted() {
        std::lock_guard<std::mutex> lock(service_.mutex);
        return service_.posted;
    }
    std::vector<uint> Closed() {
        std::lock_guard<std::mutex> lock(service_.mutex);
        return service_.closed;
    }
    void Tap(uint serverId, const QString& action) {
        QDBusMessage signal = QDBusMessage::createSignal(
            "/org/freedesktop/Notifications", "org.freedesktop.Notifications", "ActionInvoked");
        signal << serverId << action;
        bus_->send(signal);
    }

    QThread thread_;
    FakeNotificationService service_;
    std::unique_ptr<QDBusConnection> bus_;
};

TEST_F(NotifierTest, PostsTitledAlertsWhoseActionBringsTheDialPadAndRemovesThemById) {
    std::vector<int> tapped;
    Notifier notifier([&](int id) { tapped.push_back(id); });
    ASSERT_TRUE(notifier.Available());

    notifier.Post(2002, "1 new message from Alice Smith");
    ASSERT_EQ(Posted().size(), 1u);
    const auto first = Posted()[0];
    EXPECT_EQ(first.app, "VQM Dialer");
    EXPECT_EQ(first.summary, "VQM Dialer");
    EXPECT_EQ(first.body, "1 new message from Alice Smith");
    EXPECT_EQ(first.actions, (QStringList{"default", "Open DialPad"}));
    EXPECT_EQ(first.replaces, 0u);

    // A second post with the same id replaces the first instead of stacking up.
    notifier.Post(2002, "2 new messages");
    ASSERT_EQ(Posted().size(), 2u);
    EXPECT_EQ(Posted()[1].replaces, 41u);

    Tap(99, "default");  // somebody else's notification
    Tap(41, "other");    // not the action we offered
    Tap(41, "default");
    ASSERT_TRUE(Pump([&] { return !tapped.empty(); }));
    EXPECT_EQ(tapped, std::vector<int>{2002});

    notifier.Remove(2002);
    ASSERT_TRUE(Pump([&] { return !Closed().empty(); }));
    EXPECT_EQ(Closed(), std::vector<uint>{41});
    notifier.Remove(2002);  // already gone: nothing more is sent
    Pump([] { return false; }, std::chrono::milliseconds(300));
    EXPECT_EQ(Closed().size(), 1u);
}

// Message bodies, sender numbers and names reach the body: a service that reads markup must
// show them as typed, never as bold text or an image of a local file.
TEST_F(NotifierTest, BodyIsEscapedExactlyWhenTheServiceReadsMarkup) {
    const QString hostile = R"(You have 1 new SMS from <b>x</b><img src="file:///etc/passwd"> &lt;.)";
    const QString escaped =
        R"(You have 1 new SMS from &lt;b&gt;x&lt;/b&gt;&lt;img src="file:///etc/passwd"&gt; &amp;lt;.)";
    const struct {
        QStringList capabilities;
        QString body;
    } cases[] = {
        {{"actions", "body", "body-markup"}, escaped},
        {{"actions", "body"}, hostile},
    };
    for (const auto& c : cases) {
        SCOPED_TRACE(c.capabilities.join(",").toStdString());
        {
            std::lock_guard<std::mutex> lock(service_.mutex);
            service_.capabilities = c.capabilities;
            service_.posted.clear();
            service_.capabilityQueries = 0;
        }
        Notifier notifier([](int) {});
        notifier.Post(2002, hostile);
        notifier.Post(2002, hostile);
        ASSERT_EQ(Posted().size(), 2u);
        EXPECT_EQ(Posted()[0].body, c.body);
        EXPECT_EQ(Posted()[1].body, c.body);
        std::lock_guard<std::mutex> lock(service_.mutex);
        EXPECT_EQ(service_.capabilityQueries, 1);  // asked once, not for every alert
    }
    EXPECT_EQ(NotificationBody("a & b < c > d", true), "a &amp; b &lt; c &gt; d");
}

}  // namespace
}  // namespace vqm

// A private session bus for the whole test program, started before Qt first looks for one.
int main(int argc, char** argv) {
    pid_t daemon = -1;
    int out[2];
    if (pipe(out) == 0) {
        daemon = fork();
        if (daemon == 0) {
            dup2(out[1], 1);
            close(out[0]);
            execlp("dbus-daemon", "dbus-daemon", "--session", "--nofork", "--print-address=1",
                   nullptr);
            _exit(127);
        }
        close(out[1]);
        char address[512] = {};
        FILE* stream = fdopen(out[0], "r");
        if (stream && std::fgets(address, sizeof address, stream)) {
            std::string text(address);
            while (!text.empty() && text.back() == '\n')
                text.pop_back();
            qputenv("DBUS_SESSION_BUS_ADDRESS", text.c_str());
            qputenv("VQM_TEST_BUS", text.c_str());
        }
    }
    if (qEnvironmentVariableIsEmpty("QT_QPA_PLATFORM")) qputenv("QT_QPA_PLATFORM", "offscreen");
    int result;
    {
        QApplication app(argc, argv);
        ::testing::InitGoogleTest(&argc, argv);
        result = RUN_ALL_TESTS();
    }
    if (daemon > 0) {
        kill(daemon, SIGTERM);
        waitpid(daemon, nullptr, 0);
    }
    return result;
}

#include "notifier_test.moc"
