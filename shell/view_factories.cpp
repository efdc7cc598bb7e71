#include "shell/view_factories.h"

#include "calls/alerts.h"
#include "calls/call_log_view.h"
#include "calls/dial_pad_view.h"
#include "contacts/contact_picker_view.h"
#include "contacts/manage_contacts_view.h"
#include "messaging/sms_folder_view.h"
#include "messaging/write_sms_view.h"
#include "settings/settings_view.h"
#include "shell/messages.h"

namespace vqm {

namespace {

DialPad* PadOf(ShellContext& context) {
    if (!context.mainWindow) return nullptr;
    auto* view = dynamic_cast<DialPadView*>(context.mainWindow->ViewAt(kViewDialPad));
    return view ? &view->Pad() : nullptr;
}

// The SMS Folder raises and clears the DialPad's full-SIM notice, and its new-message notice
// goes once every announced message is listed.
FolderViewHooks FolderHooks(ShellContext& context) {
    FolderViewHooks hooks;
    hooks.simFullAlert = [&context](int full) {
        if (DialPad* pad = PadOf(context)) NotifySimFull(*pad, full);
    };
    hooks.newMessagesTaken = [&context] {
        DialPad* pad = PadOf(context);
        if (pad && IndexListCount(context.settings, kNewIdx) == 0) NotifyNewMessages(*pad, 0, 0);
    };
    hooks.write = [&context](WriteRequest request) { HandToWriteSms(context, std::move(request)); };
    return hooks;
}

// The write view files its sent copies and drafts through the SMS Folder's store, which pastes
// them into its pages; its picker button brings the contact picker up.
WriteViewHooks WriteHooks(ShellContext& context) {
    WriteViewHooks hooks;
    hooks.store = [&context]() -> MessageStore* {
        if (!context.mainWindow) return nullptr;
        auto* folder = dynamic_cast<SmsFolderView*>(context.mainWindow->ViewAt(kViewSmsFolder));
        return folder ? &folder->Store() : nullptr;
    };
    hooks.showPicker = [&context] {
        if (context.mainWindow) SwitchView(context.mainWindow->Views(), kViewContacts);
    };
    return hooks;
}

// The picker's OK adds its recipients to the message being written; Cancel goes back to it.
PickerHooks ContactPickerHooks(ShellContext& context) {
    PickerHooks hooks;
    hooks.pick = [&context](const std::u16string& recipients) {
        HandToWriteSms(context, AddRecipientsRequest(recipients));
    };
    hooks.cancel = [&context] {
        if (context.mainWindow) context.mainWindow->Command(kCmdViewFirst + kViewWriteSms);
    };
    return hooks;
}

}  // namespace

std::array<ViewFactory, kViewCount> DefaultViewFactories() {
    std::array<ViewFactory, kViewCount> factories;
    factories[kViewDialPad] = [](QWidget* parent, ShellContext& context) -> View* {
        return new DialPadView(parent, context, context.callLog, context.caches);
    };
    for (int i = 1; i < kViewCount; ++i)
        factories[i] = [](QWidget* parent, ShellContext&) { return new View(parent); };
    factories[kViewWriteSms] = [](QWidget* parent, ShellContext& context) -> View* {
        return new WriteSmsView(parent, context, WriteHooks(context));
    };
    factories[kViewContacts] = [](QWidget* parent, ShellContext& context) -> View* {
        return new ContactPickerView(parent, context, context.caches, ContactPickerHooks(context));
    };
    factories[kViewSmsFolder] = [](QWidget* parent, ShellContext& context) -> View* {
        return new SmsFolderView(parent, context, context.caches, FolderHooks(context));
    };
    factories[kViewManageContacts] = [](QWidget* parent, ShellContext& context) -> View* {
        return new ManageContactsView(
            parent, context, context.caches,
            [&context](const std::u16string& number) { return DialFromAnywhere(context, number); },
            [&context](const std::u16string& text) {
                HandToWriteSms(context, AddRecipientsRequest(text));
            });
    };
    factories[kViewSettings] = [](QWidget* parent, ShellContext& context) -> View* {
        return new SettingsView(parent, context);
    };
    factories[kViewCallLog] = [](QWidget* parent, ShellContext& context) -> View* {
        return new CallLogView(
            parent, context, context.callLog, context.caches,
            [&context](const std::u16string& number) { return DialFromAnywhere(context, number); });
    };
    return factories;
}

}  // namespace vqm
