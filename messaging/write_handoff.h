// What "Reply" and "Forward" of the SMS Folder hand to the Write SMS view: the recipients text
// (name, "<", number, ">;\r\n") or the body to send on. The write view takes the request when it
// comes up; until it is built, the request waits here.
#pragma once

#include <mutex>
#include <optional>
#include <string>

namespace vqm {

struct WriteRequest {
    std::u16string recipients;
    std::u16string text;
};

// One recipient in the recipients text: the name when known, then the number in "<" ">".
inline std::u16string RecipientText(const std::u16string& name, const std::u16string& number) {
    return name + u"<" + number + u">;\r\n";
}

class WriteHandoff {
  public:
    // A later request replaces one not taken yet: the user changed their mind.
    void Hand(WriteRequest request) {
        std::lock_guard<std::mutex> lock(mutex_);
        pending_ = std::move(request);
    }
    // The write view: the request, once.
    std::optional<WriteRequest> Take() {
        std::lock_guard<std::mutex> lock(mutex_);
        std::optional<WriteRequest> taken = std::move(pending_);
        pending_.reset();
        return taken;
    }

  private:
    std::mutex mutex_;
    std::optional<WriteRequest> pending_;
};

}  // namespace vqm
