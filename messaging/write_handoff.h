// The one way into the Write SMS view from elsewhere: the SMS Folder's Reply and Forward, Manage
// Contacts' Write Message and the contact picker's OK each hand it a WriteRequest. The view
// keeps the latest request here and takes it when it comes up, so the hand-over works whatever
// the view is doing at that moment. No Qt: the logic of other modules may build requests.
#pragma once

#include <mutex>
#include <optional>
#include <string>

namespace vqm {

struct WriteRequest {
    // Recipients text: pieces of name, "<", number and ">;\r\n".
    std::u16string recipients;
    // The message text (Forward).
    std::u16string text;
    // A new message (Reply, Forward): both fields are replaced. Otherwise a non-empty recipients
    // text is added behind what the field holds and the typed text stays (Write Message, the
    // picker's OK).
    bool fresh = false;
};

// Reply and Forward start a message; the contact views add to the one being written.
inline WriteRequest ReplyRequest(std::u16string recipients) {
    return WriteRequest{std::move(recipients), {}, true};
}
inline WriteRequest ForwardRequest(std::u16string text) {
    return WriteRequest{{}, std::move(text), true};
}
inline WriteRequest AddRecipientsRequest(std::u16string recipients) {
    return WriteRequest{std::move(recipients), {}, false};
}

class WriteHandoff {
  public:
    // Requests not taken yet are merged in order: a fresh one replaces what waits, added
    // recipients join it.
    void Hand(WriteRequest request) {
        std::lock_guard<std::mutex> lock(mutex_);
        if (!pending_ || request.fresh) {
            pending_ = std::move(request);
            return;
        }
        pending_->recipients += request.recipients;
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
