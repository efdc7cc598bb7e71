// The card watch's way to the card manager (over its socket) and to the card (the link).
#pragma once

#include <condition_variable>
#include <mutex>
#include <string>

#include "link/link.h"
#include "shell/card_watch.h"

namespace vqm {

class MessageLayer;

class LinkCardHost : public CardHost {
  public:
    // messages, when given, keeps delivering the listener's sends while the link closes.
    LinkCardHost(Link& link, std::string companionPath, MessageLayer* messages = nullptr)
        : link_(link), companionPath_(std::move(companionPath)), messages_(messages) {}

    bool CompanionExists() override;
    std::optional<long> SendCompanion(unsigned msg) override;
    int OpenLink() override;
    void CloseLink() override;
    int CardPresent() override;
    void Sleep(int ms) override;
    void StopWaiting() override;

  private:
    Link& link_;
    const std::string companionPath_;
    MessageLayer* messages_;
    std::mutex stopMutex_;
    std::condition_variable stopped_;
    bool stopping_ = false;
};

}  // namespace vqm
