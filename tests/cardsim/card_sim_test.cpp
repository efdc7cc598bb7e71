// The link against the simulated card over a real pseudo-terminal.
#include "cardsim/card_sim.h"

#include <fcntl.h>
#include <poll.h>
#include <termios.h>
#include <unistd.h>

#include <gtest/gtest.h>

#include <chrono>
#include <filesystem>
#include <fstream>
#include <string>
#include <thread>

#include "calls/unsolicited.h"
#include "link/link.h"
#include "support/settings_store.h"
#include "tests/common/temp_folder.h"

namespace vqm::cardsim {
namespace {

namespace fs = std::filesystem;

class CardSimTest : public ::testing::Test {
  protected:
    CardSimTest() { SetSettingString(settings_, u"PnpId", u"TAVRO_CARD_PHONE"); }

    SimConfig Config(int baud) {
        SimConfig config;
        config.baud = baud;
        config.runtimeDir = temp_ / "run";
        config.engine.dialDelayMs = 200;
        return config;
    }
    std::unique_ptr<Link> MakeLink() {
        auto link = std::make_unique<Link>(settings_, DriverRoots{temp_ / "run", temp_ / "tty"});
        link->events = &events_;
        return link;
    }

    const vqm::testing::TempFolder temp_;
    SettingsStore settings_{temp_ / "settings.db"};
    EventLog log_{temp_ / "event.log"};
    UnsolicitedEvents events_{log_};
};

TEST_F(CardSimTest, RegistersWhilePoweredAndTheLinkFindsIt) {
    CardSim sim(Config(0));
    auto link = MakeLink();
    EXPECT_EQ(CardPresent(settings_, link->roots), 0);
    ASSERT_TRUE(sim.PowerUp());
    const fs::path entry = temp_ / "run/Drivers/Active/vqm-cardsim";
    std::string pnp, name;
    std::getline(std::ifstream(entry / "PnpId"), pnp);
    std::getline(std::ifstream(entry / "Name"), name);
    EXPECT_EQ(pnp, kCardPnpId);
    EXPECT_EQ(name, sim.DevicePath());

    ASSERT_EQ(PortOpen(*link), 1);
    EXPECT_FLOAT_EQ(link->firmwareVersion, 4.0f);
    EXPECT_EQ(sim.Control("signal 7"), "OK");
    int bars = -1;
    for (int i = 0; i < 100 && (bars = GetSignalBars(*link)) == -1; ++i)
        std::this_thread::sleep_for(std::chrono::milliseconds(20));
    EXPECT_EQ(bars, 0);
    char16_t operatorName[32];
    EXPECT_EQ(GetOperatorName(*link, operatorName, 32), 1);
    EXPECT_EQ(std::u16string(operatorName), u"COSMOTE");

    sim.PowerDown();
    EXPECT_FALSE(fs::exists(entry));
    EXPECT_EQ(CardPresent(settings_, link->roots), 0);
    char reply[256];
    EXPECT_EQ(AtCommand(*link, "AT\r", reply, sizeof reply), 0u);  // the card is gone
}

TEST_F(CardSimTest, RingReachesItsHandlerOnce) {
    // Handlers are in place before the link opens: the listener may dispatch at once.
    std::atomic<int> rings{0};
    std::string callerLine;
    std::mutex m;
    events_.SetHandler(kEventRing, [&](const EventRecord&) { return ++rings, 0; });
    events_.SetHandler(kEventCallerId, [&](const EventRecord& r) {
        std::lock_guard<std::mutex> lock(m);
        callerLine = r.text;
        return 0;
    });
    CardSim sim(Config(0));
    ASSERT_TRUE(sim.PowerUp());
    auto link = MakeLink();
    ASSERT_EQ(PortOpen(*link), 1);
    EXPECT_EQ(sim.Control("ring +447700900123"), "OK");
    for (int i = 0; i < 300 && rings == 0; ++i)
        std::this_thread::sleep_for(std::chrono::milliseconds(10));
    for (int i = 0; i < 300; ++i) {
        std::lock_guard<std::mutex> lock(m);
        if (!callerLine.empty()) break;
        std::this_thread::sleep_for(std::chrono::milliseconds(10));
    }
    EXPECT_EQ(rings.load(), 1);
    std::lock_guard<std::mutex> lock(m);
    EXPECT_EQ(callerLine, "+CLIP: \"+447700900123\",145");
}

TEST_F(CardSimTest, OutputIsPacedAtTheLineRate) {
    CardSim sim(Config(19200));
    ASSERT_TRUE(sim.PowerUp());
    // Read the line itself: the link's listener would take the bytes as they come.
    const int fd = open(sim.DevicePath().c_str(), O_RDWR | O_NOCTTY | O_NONBLOCK);
    ASSERT_GE(fd, 0);
    termios tio{};
    ASSERT_EQ(tcgetattr(fd, &tio), 0);
    cfmakeraw(&tio);
    ASSERT_EQ(tcsetattr(fd, TCSANOW, &tio), 0);
    // A 1000-byte burst cannot arrive faster than 10 bits a byte at 19200 baud.
    auto start = std::chrono::steady_clock::now();
    sim.Control("garbage 1000");
    size_t got = 0;
    while (got < 1000 && std::chrono::steady_clock::now() - start < std::chrono::seconds(5)) {
        pollfd p{fd, POLLIN, 0};
        if (poll(&p, 1, 100) <= 0) continue;
        char chunk[1000];
        const ssize_t n = read(fd, chunk, sizeof chunk);
        if (n > 0) got += static_cast<size_t>(n);
    }
    close(fd);
    EXPECT_EQ(got, 1000u);
    EXPECT_GE(std::chrono::steady_clock::now() - start, std::chrono::milliseconds(500));
}

}  // namespace
}  // namespace vqm::cardsim
