// vqm-phone's requests to a running dialer. The dialer holds the card's port, so a vqm-phone
// started meanwhile sends its command over the dialer's socket; it runs here on the dialer's
// own link, on the socket's thread (never the window's), and its output goes back as the
// reply. The port lock orders these exchanges with the dialer's own. Plain C++.
#pragma once

#include <functional>
#include <string>

#include "tools/phone_commands.h"

namespace vqm {
struct Link;
class SettingsStore;
struct CallLog;
struct PhonebookCaches;

class PhoneRequests {
  public:
    // listsChanged is told (from the socket's thread) when a command changed the message
    // folders or the call log, so that the views show it.
    PhoneRequests(Link& link, SettingsStore& settings, CallLog* callLog, PhonebookCaches* caches,
                  std::string companionPath, std::function<void()> listsChanged);
    // Gives the link its event sink back.
    ~PhoneRequests();
    PhoneRequests(const PhoneRequests&) = delete;
    PhoneRequests& operator=(const PhoneRequests&) = delete;

    // True for a line that is a phone request (anything else is a window message).
    static bool IsRequest(const std::string& line);
    // The reply line to a request.
    std::string Answer(const std::string& line);

  private:
    Link& link_;
    phone::Context context_;
    // Follows the link's events for "vqm-phone events", standing between the link and the sink
    // the dialer installed, so the dialer itself sees every event as before. Put in place when
    // made, which is before the card watch opens the link.
    phone::EventFeed feed_;
};

}  // namespace vqm
