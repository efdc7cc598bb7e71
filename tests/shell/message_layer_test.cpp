// Sends between threads: run on the owner thread, never deadlock at shutdown.
#include "shell/message_layer.h"

#include <gtest/gtest.h>

#include <atomic>
#include <thread>

#include "tests/common/wait.h"

namespace vqm {
namespace {

class Recorder : public MessageTarget {
  public:
    long OnMessage(unsigned msg, long wParam, long lParam) override {
        threads.push_back(std::this_thread::get_id());
        return msg + wParam + lParam;
    }
    std::vector<std::thread::id> threads;
};

TEST(MessageLayerTest, AWorkersSendRunsOnTheOwnerThreadAndReturnsTheResult) {
    std::atomic<int> wakes{0};
    MessageLayer layer([&] { ++wakes; });
    Recorder target;
    EXPECT_EQ(layer.Send(&target, 2000, 1, 2), 2003);  // on the owner: a plain call

    std::atomic<long> result{-1};
    std::thread worker([&] { result = layer.Send(&target, 2126, 0, 0); });
    layer.WaitWhileDelivering([&] { return result.load() != -1; });
    worker.join();
    EXPECT_EQ(result.load(), 2126);
    EXPECT_GE(wakes.load(), 1);
    ASSERT_EQ(target.threads.size(), 2u);
    EXPECT_EQ(target.threads[1], std::this_thread::get_id());

    layer.Post(&target, 5, 0, 0);
    EXPECT_EQ(target.threads.size(), 2u);  // not before the owner delivers
    layer.DeliverPending();
    EXPECT_EQ(target.threads.size(), 3u);
}

TEST(MessageLayerTest, ClosingReleasesWaitingSendersAndRefusesNewOnes) {
    // A sender wakes the owner once its message is queued: then it is surely waiting.
    std::atomic<int> queued{0};
    MessageLayer layer([&] { ++queued; });
    Recorder target;
    std::atomic<int> released{0};
    std::vector<std::thread> workers;
    for (int i = 0; i < 4; ++i)
        workers.emplace_back([&] {
            if (layer.Send(&target, 2127, 0, 0) == 0) ++released;
        });
    const bool allWaiting = testing::WaitFor([&] { return queued.load() == 4; });
    layer.Close();
    for (std::thread& worker : workers)
        worker.join();
    ASSERT_TRUE(allWaiting);
    EXPECT_EQ(released.load(), 4);
    EXPECT_TRUE(target.threads.empty());
    std::thread late([&] { EXPECT_EQ(layer.Send(&target, 2127, 0, 0), 0); });
    late.join();
}

}  // namespace
}  // namespace vqm
