// Contacts inside the dialer's own window with every view the program has, sharing one set of
// caches as the program does: Manage Contacts lists the demo SIM, a contact made with New goes to
// the card, and a call from its number rings on the DialPad with the new name.
#include <gtest/gtest.h>

#include <QAction>
#include <QApplication>
#include <QMenu>
#include <QLabel>
#include <QLineEdit>
#include <QTreeWidget>
#include <chrono>
#include <functional>
#include <memory>
#include <thread>
#include <vector>

#include "calls/call_log.h"
#include "calls/dial_pad.h"
#include "cardsim/card_sim.h"
#include "contacts/manage_contacts_view.h"
#include "link/link.h"
#include "shell/card_watch.h"
#include "shell/dialogs.h"
#include "shell/main_window.h"
#include "shell/message_layer.h"
#include "shell/messages.h"
#include "shell/view_factories.h"
#include "support/settings_store.h"
#include "support/text.h"
#include "tests/common/sim_card_host.h"
#include "tests/common/temp_folder.h"
#include "tests/common/wait.h"

namespace vqm {
namespace {

using testing::SimCardHost;

bool WaitFor(const std::function<bool()>& done) {
    return testing::WaitPumping(done, std::chrono::seconds(30));
}

TEST(ContactsInWindowTest, ANewContactsCallRingsWithItsName) {
    const testing::TempFolder temp;
    SettingsStore settings(temp / "settings.db");
    SetSettingString(settings, u"InstallPath", Utf8ToUtf16(temp / "").c_str());
    SetSettingString(settings, kContactsFolderSetting, Utf8ToUtf16(temp / "cards").c_str());
    cardsim::SimConfig config;
    config.baud = 0;
    config.stateFile = temp / "card.state";
    config.engine.ringTimeoutMs = 600000;
    cardsim::CardSim sim(config);
    ASSERT_TRUE(sim.PowerUp());

    Link link(settings, DriverRoots{temp / "run", temp / "tty"});
    Dialogs dialogs;
    dialogs.SetResponder([](const DialogRequest& request) {
        if (!request.isDialog || request.title != u"New Contacts") return kIdOk;
        auto* dialog = static_cast<ContactDialog*>(request.dialog);
        dialog->Name()->setText("Nina New");
        dialog->Number()->setText("+4930555777");
        return kIdOk;
    });
    CallLog callLog(settings);
    PhonebookCaches caches(settings);
    caches.pause = [](int) {};
    ShellContext context{settings, link, dialogs, temp / "run"};
    context.callLog = &callLog;
    context.caches = &caches;
    SimCardHost host(link);
    host.device = sim.DevicePath();
    {
        MainWindow window(context, DefaultViewFactories(), &host);
        window.StopWatchTimer();
        host.messages = &window.Messages();
        ASSERT_EQ(host.OpenLink(), 1);
        window.Watch().SetCardState(2);
        auto* contacts = dynamic_cast<ManageContactsView*>(window.ViewAt(kViewManageContacts));
        ASSERT_NE(contacts, nullptr);

        window.Command(kCmdViewFirst + kViewManageContacts);
        ASSERT_TRUE(WaitFor([&] { return contacts->LoadState().sim == 2; }));
        EXPECT_EQ(contacts->List(kContactsSimPage)->topLevelItemCount(), 8);

        contacts->ShowPage(kContactsSimPage);
        contacts->Command(kCmdContactNew);
        EXPECT_EQ(contacts->List(kContactsSimPage)->topLevelItemCount(), 9);

        // The File menu carries the vCard commands while Manage Contacts is in front, and only then.
        auto fileEntries = [&window] {
            emit window.FileMenu()->aboutToShow();
            std::vector<std::string> texts;
            for (QAction* action : window.FileMenu()->actions()) {
                if (action->isSeparator()) continue;
                texts.push_back(action->text().toStdString() + (action->isEnabled() ? "" : " (grey)"));
            }
            return texts;
        };
        EXPECT_EQ(fileEntries(), (std::vector<std::string>{"Import vCard File...",
                                                           "Export vCard File...",
                                                           "Off Display (grey)", "Exit"}));
        window.Command(kCmdViewFirst + kViewCallLog);
        EXPECT_EQ(fileEntries(), (std::vector<std::string>{"Off Display (grey)", "Exit"}));
        window.Command(kCmdViewFirst + kViewManageContacts);

        ASSERT_EQ(sim.Control("ring +4930555777"), "OK");
        View* pad = window.ViewAt(kViewDialPad);
        auto text = [pad](int id) {
            auto* label = qobject_cast<QLabel*>(FindControl(pad, id));
            return label ? label->text().toStdString() : std::string();
        };
        ASSERT_TRUE(WaitFor([&] { return text(kStatusLine1Id) == "Incoming call"; }));
        EXPECT_TRUE(WaitFor([&] { return text(kStatusLine2Id) == "Nina New"; }))
            << text(kStatusLine2Id);
        EXPECT_EQ(window.Views().current, kViewDialPad);
        sim.Control("caller-hangup");
        host.CloseLink();
    }
}

}  // namespace
}  // namespace vqm
