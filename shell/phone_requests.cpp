#include "shell/phone_requests.h"

#include <utility>

#include "link/link.h"

namespace vqm {

PhoneRequests::PhoneRequests(Link& link, SettingsStore& settings, CallLog* callLog,
                             PhonebookCaches* caches, std::string companionPath,
                             std::function<void()> listsChanged)
    : link_(link), context_(link, settings), feed_(link, link.events) {
    context_.callLog = callLog;
    context_.caches = caches;
    context_.companionPath = std::move(companionPath);
    context_.listsChanged = std::move(listsChanged);
    link_.events = &feed_;
}

PhoneRequests::~PhoneRequests() {
    if (link_.events == &feed_) link_.events = feed_.Next();
}

bool PhoneRequests::IsRequest(const std::string& line) {
    const std::string tag = std::string(phone::kRequestTag) + " ";
    return line.compare(0, tag.size(), tag) == 0 || line == phone::kRequestTag;
}

std::string PhoneRequests::Answer(const std::string& line) {
    return phone::AnswerRequest(context_, &feed_, line);
}

}  // namespace vqm
