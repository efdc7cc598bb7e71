// The card's power switched from several places at once, as the control socket, a script and
// the card manager do: every switch is whole, the card's thread is started and joined once
// each time, and the card ends in the state of the last switch.
#include <gtest/gtest.h>

#include <atomic>
#include <string>
#include <thread>
#include <vector>

#include "cardsim/card_sim.h"
#include "cardsim/companion.h"
#include "support/local_socket.h"
#include "tests/common/temp_folder.h"

namespace vqm::cardsim {
namespace {

TEST(CardPowerRace, SwitchesFromEverySourceAtOnceStayWhole) {
    const vqm::testing::TempFolder temp;
    SimConfig config;
    config.baud = 0;
    config.runtimeDir = temp / "run";
    CardSim card(config);
    Companion companion(card, 0);  // powers up at once, from the caller's thread

    // Each source runs its own pattern; the starting line makes them collide from the first.
    const std::vector<std::vector<std::string>> sources = {
        {"power-up", "power-down"},
        {"power-up", "pull", "insert", "power-up"},
        {"companion-up", "companion-down"},
        {"power-up", "status", "power-down", "companion-up"},
    };
    constexpr int kRounds = 300;
    std::atomic<int> ready{0};
    std::vector<std::thread> threads;
    for (const auto& steps : sources)
        threads.emplace_back([&, steps] {
            ++ready;
            while (ready.load() < static_cast<int>(sources.size())) std::this_thread::yield();
            for (int round = 0; round < kRounds; ++round)
                for (const std::string& step : steps) {
                    if (step == "companion-up")
                        companion.OnMessage(kMsgCardPowerUp, 0, 0, Clock::now());
                    else if (step == "companion-down")
                        companion.OnMessage(kMsgCardPowerDown, 0, 0, Clock::now());
                    else
                        card.Control(step);
                }
        });
    for (std::thread& thread : threads)
        thread.join();

    // Whatever the collisions left, the next switches are obeyed and agree with the status.
    ASSERT_EQ(card.Control("insert"), "OK");
    ASSERT_EQ(card.Control("power-up"), "OK");
    EXPECT_TRUE(card.Powered());
    EXPECT_FALSE(card.DevicePath().empty());
    EXPECT_NE(card.Control("status").find("powered=1"), std::string::npos);
    ASSERT_EQ(card.Control("pull"), "OK");
    EXPECT_FALSE(card.Powered());
    EXPECT_TRUE(card.DevicePath().empty());
    EXPECT_EQ(card.Control("power-up"), "ERROR: no card inserted");
    EXPECT_NE(card.Control("status").find("powered=0"), std::string::npos);
}

}  // namespace
}  // namespace vqm::cardsim
