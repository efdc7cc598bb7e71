#include "shell/view_factories.h"

#include "calls/call_log_view.h"
#include "calls/dial_pad_view.h"
#include "contacts/manage_contacts_view.h"

namespace vqm {

std::array<ViewFactory, kViewCount> DefaultViewFactories() {
    std::array<ViewFactory, kViewCount> factories;
    factories[kViewDialPad] = [](QWidget* parent, ShellContext& context) -> View* {
        return new DialPadView(parent, context, context.callLog, context.caches);
    };
    for (int i = 1; i < kViewCount; ++i)
        factories[i] = [](QWidget* parent, ShellContext&) { return new View(parent); };
    factories[kViewManageContacts] = [](QWidget* parent, ShellContext& context) -> View* {
        return new ManageContactsView(
            parent, context, context.caches,
            [&context](const std::u16string& number) { return DialFromAnywhere(context, number); },
            [&context](const std::u16string& text) { HandRecipientsToWriteSms(context, text); });
    };
    factories[kViewCallLog] = [](QWidget* parent, ShellContext& context) -> View* {
        return new CallLogView(
            parent, context, context.callLog, context.caches,
            [&context](const std::u16string& number) { return DialFromAnywhere(context, number); });
    };
    return factories;
}

}  // namespace vqm
