// A scripted card on a pseudo-terminal for the tests of the link and the AT wrappers: echoes what
// it is sent and answers each command line with whatever the test's responder returns.
#pragma once

#include <fcntl.h>
#include <poll.h>
#include <stdlib.h>
#include <unistd.h>

#include <atomic>
#include <functional>
#include <mutex>
#include <string>
#include <thread>

namespace vqm::testing {

class FakeCard {
  public:
    using Responder = std::function<std::string(const std::string& command)>;

    explicit FakeCard(Responder responder) : responder_(std::move(responder)) {
        master_ = posix_openpt(O_RDWR | O_NOCTTY);
        grantpt(master_);
        unlockpt(master_);
        slave_ = ptsname(master_);
        // Keep the slave side open ourselves so the line stays up between the link's opens.
        holder_ = open(slave_.c_str(), O_RDWR | O_NOCTTY);
        thread_ = std::thread([this] { Run(); });
    }
    ~FakeCard() {
        stop_ = true;
        thread_.join();
        Pull();
        if (holder_ >= 0) close(holder_);
    }

    const std::string& Device() const { return slave_; }
    // The card vanishes: the link's reads fail from now on.
    void Pull() {
        std::lock_guard<std::mutex> lock(mutex_);
        if (master_ >= 0) close(master_);
        master_ = -1;
        if (holder_ >= 0) close(holder_);
        holder_ = -1;
    }
    void Send(const std::string& bytes) {
        std::lock_guard<std::mutex> lock(mutex_);
        if (master_ >= 0) (void)!write(master_, bytes.data(), bytes.size());
    }
    int Commands() const { return commands_; }

  private:
    void Run() {
        std::string line;
        while (!stop_) {
            int fd;
            {
                std::lock_guard<std::mutex> lock(mutex_);
                fd = master_;
            }
            if (fd < 0) return;
            pollfd p{fd, POLLIN, 0};
            if (poll(&p, 1, 20) <= 0 || !(p.revents & POLLIN)) continue;
            char c;
            if (read(fd, &c, 1) != 1) continue;
            Send(std::string(1, c));  // echo
            if (c != '\r' && c != 0x1A) {
                line += c;
                continue;
            }
            ++commands_;
            std::string answer = responder_(line);
            line.clear();
            Send(answer);
        }
    }

    Responder responder_;
    int master_ = -1;
    int holder_ = -1;
    std::string slave_;
    std::mutex mutex_;
    std::thread thread_;
    std::atomic<bool> stop_{false};
    std::atomic<int> commands_{0};
};

}  // namespace vqm::testing
