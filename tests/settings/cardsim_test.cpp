// The settings wrappers end to end: the link over a pseudo-terminal to the simulated card, whose
// network side the tests drive with control commands.
#include <gtest/gtest.h>

#include <chrono>
#include <memory>
#include <string>
#include <thread>

#include "cardsim/card_sim.h"
#include "link/link.h"
#include "settings/barring_at.h"
#include "settings/forwarding_at.h"
#include "settings/network_at.h"
#include "settings/security_at.h"
#include "support/settings_store.h"
#include "tests/common/link_waits.h"
#include "tests/common/temp_folder.h"

namespace vqm {
namespace {

using cardsim::CardSim;
using cardsim::SimConfig;
using testing::TempFolder;

class SettingsCardTest : public ::testing::Test {
  protected:
    std::unique_ptr<CardSim> StartCard() {
        SimConfig config;
        config.baud = 0;
        config.runtimeDir = temp_ / "run";
        config.stateFile = temp_ / "card.state";
        auto sim = std::make_unique<CardSim>(config);
        EXPECT_TRUE(sim->PowerUp());
        link_ = std::make_unique<Link>(settings_, DriverRoots{temp_ / "run", temp_ / "tty"});
        testing::ShortenLinkWaits(*link_);
        EXPECT_EQ(PortOpenDevice(*link_, sim->DevicePath().c_str()), 1);
        return sim;
    }
    void StopCard() {
        PortClose(*link_);
        link_.reset();
        sim_.reset();
    }
    void SetUp() override { sim_ = StartCard(); }
    void TearDown() override {
        if (link_) PortClose(*link_);
    }
    std::u16string Operator() {
        char16_t name[kOperatorNameSize] = u"";
        return CurrentOperatorName(*link_, name, kOperatorNameSize) ? name : u"<none>";
    }
    // The forward state of a class and reason, with its number when active.
    std::u16string Forward(int serviceClass, int reason) {
        char16_t number[32] = u"";
        const int state = QueryForward(*link_, serviceClass, reason, number, 32);
        return state == 1 ? number : (state == 0 ? u"NOT ACTIVE" : u"Unknown");
    }

    TempFolder temp_;
    SettingsStore settings_{temp_ / "settings.db"};
    std::unique_ptr<CardSim> sim_;
    std::unique_ptr<Link> link_;
};

TEST_F(SettingsCardTest, SearchRegisterAndAutomaticSelection) {
    EXPECT_EQ(Operator(), u"COSMOTE");
    EXPECT_EQ(NetworkMode(*link_), 0);
    OperatorName names[8];
    int count = 0;
    ASSERT_EQ(NetworkSearch(*link_, names, 8, &count), 1);
    ASSERT_EQ(count, 4);
    EXPECT_EQ(std::u16string(names[0]), u"COSMOTE");
    EXPECT_EQ(std::u16string(names[1]), u"PANAFON");
    EXPECT_EQ(std::u16string(names[2]), u"TELESTET");
    EXPECT_EQ(std::u16string(names[3]), u"Itineris");  // forbidden, still listed

    EXPECT_EQ(NetworkRegister(*link_, names[1]), 0);
    EXPECT_EQ(Operator(), u"PANAFON");
    EXPECT_EQ(NetworkMode(*link_), 1);  // chosen by hand
    const int refused = NetworkRegister(*link_, names[3]);
    EXPECT_TRUE(refused == -1 || refused == 4) << refused;
    EXPECT_EQ(Operator(), u"PANAFON");

    // Both MOVISTAR networks are heard; the name registers the first table entry's code.
    EXPECT_EQ(sim_->Control("networks 21407:2,21402:1"), "OK");
    EXPECT_EQ(Operator(), u"MOVISTAR");
    EXPECT_EQ(NetworkRegister(*link_, u"MOVISTAR"), 0);
    EXPECT_NE(sim_->Control("status").find("operator=21402"), std::string::npos);
    EXPECT_EQ(NetworkAutomatic(*link_), 0);
    EXPECT_EQ(NetworkMode(*link_), 0);
}

TEST_F(SettingsCardTest, ForwardingPerClassAndReason) {
    for (int reason = 0; reason < 4; ++reason)
        EXPECT_EQ(Forward(1, reason), u"NOT ACTIVE") << reason;
    EXPECT_EQ(ActivateForward(*link_, 1, kForwardNoReply, u"+447700900123", 30), 0);
    EXPECT_EQ(ActivateForward(*link_, 2, kForwardNoReply, u"0123", 20), 0);
    EXPECT_EQ(ActivateForward(*link_, 4, kForwardUnconditional, u"0456", 20), 0);
    EXPECT_EQ(Forward(1, kForwardNoReply), u"+447700900123");
    EXPECT_EQ(Forward(2, kForwardNoReply), u"0123");
    EXPECT_EQ(Forward(4, kForwardNoReply), u"NOT ACTIVE");
    EXPECT_EQ(Forward(4, kForwardUnconditional), u"0456");

    EXPECT_EQ(EraseForward(*link_, 1, kForwardNoReply), 0);
    EXPECT_EQ(Forward(1, kForwardNoReply), u"NOT ACTIVE");
    EXPECT_EQ(DisableAllForwards(*link_, 2), 0);
    EXPECT_EQ(Forward(2, kForwardNoReply), u"NOT ACTIVE");
    EXPECT_EQ(Forward(4, kForwardUnconditional), u"0456");  // other classes untouched

    // A forward the network set up on its own side shows the same way.
    EXPECT_EQ(sim_->Control("forward 1 4 on 0555"), "OK");
    EXPECT_EQ(Forward(4, kForwardBusy), u"0555");
    EXPECT_EQ(DisableAllForwardsAllClasses(*link_), 0);
    EXPECT_EQ(Forward(4, kForwardUnconditional), u"NOT ACTIVE");
    EXPECT_EQ(Forward(4, kForwardBusy), u"NOT ACTIVE");
}

TEST_F(SettingsCardTest, BarringAndCodes) {
    EXPECT_EQ(QueryBarring(*link_, 1, 0), 0);
    EXPECT_EQ(LockBarring(*link_, 1, 0, u"0000"), 0);
    EXPECT_EQ(QueryBarring(*link_, 1, 0), 1);
    EXPECT_EQ(QueryBarring(*link_, 2, 0), 0);
    const int wrong = LockBarring(*link_, 2, 0, u"1111");
    EXPECT_TRUE(wrong == -1 || wrong == 4) << wrong;
    EXPECT_EQ(QueryBarring(*link_, 2, 0), 0);

    // Barred for all three classes by the network: active on every class.
    EXPECT_EQ(sim_->Control("barring AI 7 on"), "OK");
    for (int serviceClass : {1, 2, 4})
        EXPECT_EQ(QueryBarring(*link_, serviceClass, 3), 1) << serviceClass;
    EXPECT_EQ(UnlockBarring(*link_, 2, 7, u"0000"), 0);
    EXPECT_EQ(QueryBarring(*link_, 2, 3), 0);
    EXPECT_EQ(QueryBarring(*link_, 4, 3), 1);
    EXPECT_EQ(UnlockAllBarrings(*link_, u"0000"), 0);
    EXPECT_EQ(QueryBarring(*link_, 4, 3), 0);
    EXPECT_EQ(QueryBarring(*link_, 1, 0), 0);

    // The PIN request, and the new codes taking the place of the old.
    EXPECT_EQ(QueryLock(*link_, 0), 0);
    EXPECT_EQ(QueryLock(*link_, 1), 1);
    EXPECT_EQ(SetLock(*link_, 0, 1, u"1234"), 0);
    EXPECT_EQ(QueryLock(*link_, 0), 1);
    EXPECT_EQ(ChangeCode(*link_, 0, u"1234", u"4321"), 0);
    EXPECT_NE(SetLock(*link_, 0, 0, u"1234"), 0);
    EXPECT_EQ(SetLock(*link_, 0, 0, u"4321"), 0);
    EXPECT_EQ(ChangeCode(*link_, 3, u"0000", u"9999"), 0);
    EXPECT_NE(LockBarring(*link_, 1, 1, u"0000"), 0);
    EXPECT_EQ(LockBarring(*link_, 1, 1, u"9999"), 0);
    EXPECT_EQ(SetLock(*link_, 2, 1, u"12345"), 0);
    EXPECT_EQ(QueryLock(*link_, 2), 1);
}

TEST_F(SettingsCardTest, ServicesOutliveTheCardsRun) {
    EXPECT_EQ(ActivateForward(*link_, 1, kForwardBusy, u"0777", 20), 0);
    EXPECT_EQ(LockBarring(*link_, 4, 2, u"0000"), 0);
    EXPECT_EQ(ChangeCode(*link_, 3, u"0000", u"2580"), 0);
    EXPECT_EQ(NetworkRegister(*link_, u"TELESTET"), 0);
    StopCard();

    sim_ = StartCard();
    EXPECT_EQ(Forward(1, kForwardBusy), u"0777");
    EXPECT_EQ(QueryBarring(*link_, 4, 2), 1);
    EXPECT_EQ(UnlockBarring(*link_, 4, 6, u"2580"), 0);
    EXPECT_EQ(QueryBarring(*link_, 4, 2), 0);
    EXPECT_EQ(Operator(), u"TELESTET");
}

}  // namespace
}  // namespace vqm
