// The message layer: views, pages and the main window each answer OnMessage, and any thread
// may send them a message. A send is synchronous, as a window message was: from the thread
// that owns the windows it is a plain call; from a worker it runs on the owner thread while
// the worker waits. Shutdown closes the layer, so a worker's send is refused (0) rather than
// left waiting for a window that is gone.
#pragma once

#include <condition_variable>
#include <deque>
#include <functional>
#include <mutex>
#include <thread>

namespace vqm {

class MessageTarget {
  public:
    virtual ~MessageTarget() = default;
    virtual long OnMessage(unsigned msg, long wParam, long lParam) = 0;
};

class MessageLayer {
  public:
    // wake asks the owner thread's event loop to call DeliverPending soon; it is called from
    // worker threads. The thread that builds the layer owns every target.
    explicit MessageLayer(std::function<void()> wake) : wake_(std::move(wake)) {}
    MessageLayer(const MessageLayer&) = delete;
    MessageLayer& operator=(const MessageLayer&) = delete;

    long Send(MessageTarget* target, unsigned msg, long wParam, long lParam);
    // Queued for the owner thread; the sender does not wait.
    void Post(MessageTarget* target, unsigned msg, long wParam, long lParam);
    bool OnOwnerThread() const { return std::this_thread::get_id() == owner_; }

    // Owner thread: runs every queued message.
    void DeliverPending();
    // Owner thread: waits until done() holds, delivering the workers' sends meanwhile, so that
    // joining a worker that is sending to a window cannot deadlock.
    void WaitWhileDelivering(const std::function<bool()>& done);
    // Owner thread: from now on sends and posts from workers are refused with 0; those
    // already waiting are released with 0.
    void Close();

  private:
    struct Pending {
        MessageTarget* target;
        unsigned msg;
        long wParam, lParam;
        bool waited;  // a Send: the sender waits for result and done
        long result = 0;
        bool done = false;
    };

    std::function<void()> wake_;
    const std::thread::id owner_ = std::this_thread::get_id();
    std::mutex mutex_;
    std::condition_variable changed_;
    std::deque<Pending*> queue_;
    bool closed_ = false;
};

}  // namespace vqm
