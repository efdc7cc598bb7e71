#include "link/link.h"

#include <gtest/gtest.h>
#include <unistd.h>

#include <atomic>
#include <chrono>
#include <cstring>
#include <ctime>
#include <filesystem>
#include <fstream>
#include <mutex>
#include <string>
#include <thread>
#include <vector>

#include "link/operators.h"
#include "support/settings_store.h"
#include "tests/common/fake_card.h"
#include "tests/common/link_waits.h"
#include "tests/common/temp_folder.h"
#include "tests/common/wait.h"

namespace vqm {
namespace {

namespace fs = std::filesystem;
using testing::FakeCard;

std::string Ok(const std::string& info = "") {
    return (info.empty() ? "" : "\r\n" + info + "\r\n") + "\r\nOK\r\n";
}

// The usual answers of a card; tests override what they need.
std::string StandardCard(const std::string& command) {
    if (command == "AT+GMR") return Ok("SW4.00");
    if (command == "AT+CLCC") return Ok();
    return Ok();
}

// Records the unsolicited codes the link hands over, and on which thread they are handled.
struct RecordingSink : EventSink {
    // The listener hands codes over on its own thread while the test reads them.
    std::recursive_mutex mutex;
    Link* link = nullptr;
    std::vector<std::string> queued;
    size_t next = 0;
    std::vector<std::thread::id> handledOn;
    std::vector<int> portStateWhenHandled;
    int UnsolicitedScan(const char* text, int length) override {
        std::lock_guard<std::recursive_mutex> lock(mutex);
        std::string s(text, length);
        int found = 0;
        for (size_t at = s.find("+CRING:"); at != std::string::npos;
             at = s.find("+CRING:", at + 7)) {
            queued.push_back(s.substr(at, s.find('\r', at) - at));
            found = 1;
        }
        return found;
    }
    int QueueLine(const char* line, int length) override {
        std::lock_guard<std::recursive_mutex> lock(mutex);
        std::string s(line, length);
        if (s.rfind("+CRING:", 0) != 0) return 0;
        queued.push_back(s);
        return 1;
    }
    int DispatchOldest() {
        std::lock_guard<std::recursive_mutex> lock(mutex);
        if (next >= queued.size()) return 0;
        ++next;
        handledOn.push_back(std::this_thread::get_id());
        portStateWhenHandled.push_back(link ? link->portState.load() : -1);
        return 1;
    }
    int DispatchAll(int* rings) override {
        int n = 0;
        while (DispatchOldest())
            ++n;
        if (rings) *rings += n;
        return n;
    }
};

// The messages the listener posts to the main window, in order.
struct PostedMessages {
    std::mutex mutex;
    std::vector<int> messages;
    void Add(int msg) {
        std::lock_guard<std::mutex> lock(mutex);
        messages.push_back(msg);
    }
    long Count(int msg) {
        std::lock_guard<std::mutex> lock(mutex);
        return std::count(messages.begin(), messages.end(), msg);
    }
};

class LinkTest : public ::testing::Test {
  protected:
    // A link whose listener passes come twenty times as fast, posting into posted.
    std::unique_ptr<Link> OpenListening(FakeCard& card, PostedMessages& posted) {
        auto link =
            std::make_unique<Link>(settings_, DriverRoots{folder_ + "/run", folder_ + "/tty"});
        link->sleepMs = [](int ms) {
            std::this_thread::sleep_for(std::chrono::milliseconds(ms / 20 + 1));
        };
        link->postToMain = [&posted](int msg) { posted.Add(msg); };
        if (PortOpenDevice(*link, card.Device().c_str()) != 1) return nullptr;
        return link;
    }

    std::unique_ptr<Link> OpenLink(FakeCard& card) {
        auto link =
            std::make_unique<Link>(settings_, DriverRoots{folder_ + "/run", folder_ + "/tty"});
        testing::ShortenLinkWaits(*link);
        link->events = &sink_;
        sink_.link = link.get();
        EXPECT_EQ(PortOpenDevice(*link, card.Device().c_str()), 1);
        return link;
    }

    std::string Command(Link& link, const char* command, size_t size = 256) {
        std::vector<char> reply(size);
        unsigned n = AtCommand(link, command, reply.data(), reply.size());
        return std::string(reply.data(), n);
    }

    const testing::TempFolder temp_;
    const std::string folder_ = temp_.Path();
    SettingsStore settings_{folder_ + "/settings.db"};
    RecordingSink sink_;
};

TEST(FinalResult, TableOrderDecides) {
    auto code = [](const std::string& reply) {
        return AtFinalResult(reply.data(), int(reply.size()));
    };
    EXPECT_EQ(code("\r\nNO CARRIER\r\n"), 3);  // never 16, though "CARRIER\r" is inside
    EXPECT_EQ(code("\r\nCARRIER\r\n"), 16);
    EXPECT_EQ(code("\r\n+CME: x\r\nOK\r\n\r\nERROR\r\n"), 4);
    EXPECT_EQ(code("\r\n+CSQ: 20,0\r\n\r\nOK\r\n"), 0);
    EXPECT_EQ(code("\r\nBUSY\r\n"), 7);
    EXPECT_EQ(code("\r\nNO ANSWER\r\n"), 8);
    EXPECT_EQ(code("\r\nBLACKLISTED\r\n"), 14);
    EXPECT_EQ(code("\r\nDELAYED\r\n"), 13);
    EXPECT_EQ(code("\r\nOK"), -1);  // a result counts only at a line's end
    EXPECT_EQ(code(""), -1);
}

TEST(Operators, NamesAndCodes) {
    char name[32];
    EXPECT_EQ(OperatorNameByCode(20201, name, sizeof name), 7);
    EXPECT_STREQ(name, "COSMOTE");
    std::strcpy(name, "keep");
    EXPECT_EQ(OperatorNameByCode(99999, name, sizeof name), 0);
    EXPECT_STREQ(name, "keep");
    EXPECT_EQ(OperatorCodeByName("PANAFON"), 20205);
    EXPECT_EQ(OperatorCodeByName("MOVISTAR"), 21402);  // the first of the two
    EXPECT_EQ(OperatorCodeByName("movistar"), -1);
    EXPECT_EQ(OperatorCodeByName("ICMS"), 74601);
}

TEST_F(LinkTest, DiscoveryPicksTheFirstMatchingDriver) {
    auto addDriver = [&](const std::string& key, const std::string& pnp, const std::string& name) {
        fs::path dir = fs::path(folder_) / "run/Drivers/Active" / key;
        fs::create_directories(dir);
        std::ofstream(dir / "PnpId") << pnp << "\n";
        std::ofstream(dir / "Name") << name << "\n";
    };
    DriverRoots roots{folder_ + "/run", folder_ + "/tty"};
    addDriver("b", "Tavro_Mobile_Phones-TAVRO_CARD_PHONE-4C2D", "/dev/pts/second");
    addDriver("a", "Tavro_Mobile_Phones-TAVRO_CARD_PHONE-4C2E", "/dev/pts/first");
    addDriver("c", "Other_Modem", "/dev/ttyUSB9");
    fs::create_directories(folder_ + "/tty/ttyS0/device");
    std::ofstream(folder_ + "/tty/ttyS0/device/modalias") << "platform:serial8250\n";
    fs::create_directories(folder_ + "/tty/tty1");  // a console: no device, not listed

    auto drivers = ListActiveDrivers(roots);
    ASSERT_EQ(drivers.size(), 4u);
    EXPECT_EQ(drivers[0].key, "a");
    EXPECT_EQ(drivers[3].name, "/dev/ttyS0");
    EXPECT_EQ(drivers[3].pnpId, "platform:serial8250");

    char port[256] = "";
    EXPECT_EQ(CardPresent(settings_, roots), 0);  // no "PnpId" setting: never found
    EXPECT_EQ(FindCardPort(settings_, roots, port, sizeof port), 0);
    SetSettingString(settings_, u"PnpId", u"TAVRO_CARD_PHONE");
    EXPECT_EQ(FindCardPort(settings_, roots, port, sizeof port), 1);
    EXPECT_STREQ(port, "/dev/pts/first");
    SetSettingString(settings_, u"PnpId", u"tavro");  // case matters
    EXPECT_EQ(CardPresent(settings_, roots), 0);
    SetSettingString(settings_, u"PnpId", u"serial8250");
    EXPECT_EQ(FindCardPort(settings_, roots, port, sizeof port), 1);
    EXPECT_STREQ(port, "/dev/ttyS0");
}

TEST_F(LinkTest, OpenInitialisesTheCardAndReadsItsFirmware) {
    std::vector<std::string> seen;
    std::mutex seenMutex;
    FakeCard card([&](const std::string& command) {
        std::lock_guard<std::mutex> lock(seenMutex);
        seen.push_back(command);
        return StandardCard(command);
    });
    auto link = OpenLink(card);
    EXPECT_FLOAT_EQ(link->firmwareVersion, 4.0f);
    std::lock_guard<std::mutex> lock(seenMutex);
    ASSERT_GE(seen.size(), 8u);
    EXPECT_EQ(
        std::vector<std::string>(seen.begin(), seen.begin() + 8),
        (std::vector<std::string>{"AT&F", "ATE1", "ATX5", "AT+CSCS=\"8859-1\"", "AT+CBST=51,0,1",
                                  "AT+CLIP=1;+CRC=1", "AT+CNMI=1,1,0,0,0", "AT+GMR"}));
}

TEST_F(LinkTest, SecondOpenOfAHeldPortIsRefused) {
    FakeCard card(StandardCard);
    auto first = OpenLink(card);
    Link second(settings_, DriverRoots{folder_ + "/run", folder_ + "/tty"});
    EXPECT_EQ(PortOpenDevice(second, card.Device().c_str()), 0);
    PortClose(*first);
    EXPECT_EQ(PortOpenDevice(second, card.Device().c_str()), 1);
}

// The port goes to waiting parties in the order they asked for it, a try never jumps the
// queue, and closing the port sends every waiter away empty-handed.
TEST_F(LinkTest, PortLockServesWaitersFirstComeFirstServed) {
    Link link(settings_, DriverRoots{folder_ + "/run", folder_ + "/tty"});
    link.portState.store(1);  // open and free, as PortOpen leaves it
    ASSERT_EQ(PortLock(link), 1);

    std::mutex orderMutex;
    std::vector<int> order;
    std::vector<std::thread> waiters;
    for (int i = 0; i < 4; ++i) {
        const unsigned long before = link.nextTicket;
        waiters.emplace_back([&, i] {
            if (PortLock(link) != 1) return;
            {
                std::lock_guard<std::mutex> lock(orderMutex);
                order.push_back(i);
            }
            PortUnlock(link);
        });
        // The next waiter asks only once this one holds its ticket.
        ASSERT_TRUE(testing::WaitFor([&] {
            std::lock_guard<std::mutex> lock(link.portMutex);
            return link.nextTicket == before + 1;
        }));
    }
    PortUnlock(link);
    for (auto& waiter : waiters)
        waiter.join();
    EXPECT_EQ(order, (std::vector<int>{0, 1, 2, 3}));

    // While someone waits, a try is refused even at the moment the port is free; the port
    // then goes to the waiter.
    auto waitForWaiter = [&] {
        return testing::WaitFor([&] {
            std::lock_guard<std::mutex> lock(link.portMutex);
            return link.nextTicket > link.servingTicket;
        });
    };
    ASSERT_EQ(PortLock(link), 1);
    std::atomic<int> lateResult{-1};
    std::thread late([&] { lateResult = PortLock(link); });
    ASSERT_TRUE(waitForWaiter());
    {
        std::lock_guard<std::mutex> lock(link.portMutex);
        link.portState.store(1);  // free, the waiter not yet told
    }
    EXPECT_EQ(PortTryLock(link), 0);
    link.portChanged.notify_all();
    late.join();
    EXPECT_EQ(lateResult.load(), 1);

    // The port closes while someone waits: the waiter gives up instead of waiting for ever.
    std::thread closed([&] { lateResult = PortLock(link); });
    ASSERT_TRUE(waitForWaiter());
    {
        std::lock_guard<std::mutex> lock(link.portMutex);
        link.portState.store(0);
    }
    link.portChanged.notify_all();
    closed.join();
    EXPECT_EQ(lateResult.load(), 0);
}

TEST_F(LinkTest, QueriesReadTheirReplies) {
    const std::pair<const char*, int> bars[] = {{"99", 4}, {"31", 4}, {"30", 3},
                                                {"24", 3}, {"23", 2}, {"8", 1},
                                                {"7", 0},  {"0", 0},  {nullptr, 0}};
    std::atomic<int> current{0};
    FakeCard card([&](const std::string& command) {
        if (command == "AT+CSQ") {
            const char* quality = bars[current].first;
            return quality ? Ok(std::string("+CSQ: ") + quality + ",0") : Ok();
        }
        if (command == "AT+COPS?") return Ok("+COPS: 0,2,20205");
        if (command == "AT+CLVL?") return Ok("+CLVL: 7");
        if (command == "AT+CLVL=3") return Ok();
        if (command == "AT+CLVL=11") return std::string("\r\nERROR\r\n");
        if (command == "AT+GMI") return Ok("Tavro Mobile Phones");
        if (command == "AT+GMM") return Ok("TAVRO CARD PHONE 2.0");
        return StandardCard(command);
    });
    auto link = OpenLink(card);
    // The polls give up (-1) while the listener holds the port; ask again then.
    auto poll = [&](int (*query)(Link&)) {
        int result = -1;
        for (int attempt = 0; attempt < 200 && result == -1; ++attempt) {
            result = query(*link);
            if (result == -1) std::this_thread::sleep_for(std::chrono::milliseconds(20));
        }
        return result;
    };
    for (int i = 0; i < 9; ++i) {
        current = i;
        EXPECT_EQ(poll([](Link& l) { return GetSignalBars(l); }), bars[i].second)
            << (bars[i].first ? bars[i].first : "none");
    }
    char16_t text[64];
    EXPECT_EQ(GetOperatorName(*link, text, 64), 1);
    EXPECT_EQ(std::u16string(text), u"PANAFON");
    EXPECT_EQ(poll(GetSpeakerVolume), 7);
    EXPECT_EQ(SetSpeakerVolume(*link, 3), 0);
    EXPECT_EQ(SetSpeakerVolume(*link, 11), 4);
    char16_t maker[64], model[64], firmware[64];
    EXPECT_EQ(GetCardIdentity(*link, maker, 64, model, 64, firmware, 64), 1);
    EXPECT_EQ(std::u16string(maker), u"Tavro Mobile Phones");
    EXPECT_EQ(std::u16string(model), u"TAVRO CARD PHONE 2.0");
    EXPECT_EQ(std::u16string(firmware), u"SW4.00");
}

TEST_F(LinkTest, RingDuringACommandIsHandledOnceAfterThePortIsFree) {
    FakeCard card([](const std::string& command) {
        if (command == "AT+CSQ")
            return std::string("\r\n+CRING: VOICE\r\n\r\n+CSQ: 20,0\r\n\r\nOK\r\n");
        return StandardCard(command);
    });
    auto link = OpenLink(card);
    std::string reply = Command(*link, "AT+CSQ\r");
    EXPECT_EQ(reply, "\r\n+CSQ: 20,0\r\n\r\nOK\r\n");  // the ring is not part of it
    auto handled = [&] {
        std::lock_guard<std::recursive_mutex> lock(sink_.mutex);
        return sink_.handledOn.size();
    };
    EXPECT_TRUE(testing::WaitFor([&] { return handled() >= 1; }));
    PortClose(*link);
    ASSERT_EQ(sink_.queued.size(), 1u);
    ASSERT_EQ(sink_.handledOn.size(), 1u);
    // One dispatcher, the listener, hands records over in order, with the port free.
    EXPECT_NE(sink_.handledOn[0], std::this_thread::get_id());
    EXPECT_EQ(sink_.portStateWhenHandled[0], 1);
}

TEST_F(LinkTest, BadInputFromTheCard) {
    std::string big(10000, 'x');
    FakeCard card([&](const std::string& command) {
        if (command == "AT+BIG") return "\r\n" + big + "\r\n\r\nOK\r\n";
        if (command == "AT+JUNK") return std::string("\r\n\0\0\xFF\x01junk\0\r\n\r\nERROR\r\n", 23);
        return StandardCard(command);
    });
    auto link = OpenLink(card);
    std::string reply = Command(*link, "AT+BIG\r");
    EXPECT_EQ(reply.size(), 255u);  // capped at the buffer; the rest read and dropped
    EXPECT_EQ(reply.substr(2, 10), "xxxxxxxxxx");
    // The dropped tail does not leak into the next reply.
    EXPECT_EQ(Command(*link, "AT\r"), "\r\nOK\r\n");
    std::string junk = Command(*link, "AT+JUNK\r");
    EXPECT_EQ(junk.size(), 23u);
    EXPECT_EQ(AtFinalResult(junk.data(), int(junk.size())), 4);
}

TEST_F(LinkTest, PulledCardEndsTheTransactionAtOnce) {
    std::atomic<FakeCard*> self{nullptr};
    FakeCard card([&](const std::string& command) {
        if (command == "AT+PULL") {
            std::thread([&] { self.load()->Pull(); }).detach();
            return std::string();
        }
        return StandardCard(command);
    });
    self = &card;
    auto link = OpenLink(card);
    auto start = std::chrono::steady_clock::now();
    char reply[256];
    EXPECT_EQ(AtCommand(*link, "AT+PULL\r", reply, sizeof reply), 0u);
    EXPECT_LT(std::chrono::steady_clock::now() - start, std::chrono::seconds(5));
    EXPECT_EQ(AtCommand(*link, "AT\r", reply, sizeof reply), 0u);
    PortClose(*link);
}

TEST_F(LinkTest, SilentCardWaitsUntilThePortCloses) {
    FakeCard card([](const std::string& command) {
        return command == "AT+SILENT" ? std::string() : StandardCard(command);
    });
    auto link = OpenLink(card);
    std::atomic<unsigned> result{99};
    std::thread waiter([&] {
        char reply[256];
        result = AtCommand(*link, "AT+SILENT\r", reply, sizeof reply);
    });
    // Still waiting for an answer 300 ms on.
    EXPECT_FALSE(
        testing::WaitFor([&] { return result.load() != 99u; }, std::chrono::milliseconds(300)));
    // Meanwhile a periodic poll gives up rather than queue behind it.
    char reply[256];
    EXPECT_EQ(AtCommandTry(*link, "AT+CSQ\r", reply, sizeof reply), 0u);
    PortClose(*link);
    waiter.join();
    EXPECT_EQ(result.load(), 0u);
}

TEST_F(LinkTest, ListenerReportsActiveCallsAndOneEnd) {
    std::atomic<int> callPolls{0};
    std::atomic<bool> active{true};
    FakeCard card([&](const std::string& command) {
        if (command == "AT+CLCC") {
            ++callPolls;
            return active ? Ok("+CLCC: 1,0,0,0,0,\"+441234\",145") : Ok();
        }
        return StandardCard(command);
    });
    PostedMessages posted;
    auto link = OpenListening(card, posted);
    ASSERT_NE(link, nullptr);
    auto count = [&](int msg) { return posted.Count(msg); };
    // Every pass while the call lasts.
    EXPECT_TRUE(testing::WaitFor([&] { return count(kMsgCallActive) >= 3; }));
    active = false;
    const int polls = callPolls;
    EXPECT_TRUE(testing::WaitFor([&] { return callPolls >= polls + 4; }));
    PortClose(*link);
    EXPECT_EQ(count(kMsgCallListEmpty), 1);
    EXPECT_FALSE(link->listener.joinable());
}

// A ringing call is reported on every pass, as an active one is: a DialPad still talking on
// an earlier call learns from it that that call is over.
TEST_F(LinkTest, ListenerReportsARingingCallOnEveryPass) {
    FakeCard card([&](const std::string& command) {
        return command == "AT+CLCC" ? Ok("+CLCC: 1,1,4,0,0,\"+441234\",145")
                                    : StandardCard(command);
    });
    PostedMessages posted;
    auto link = OpenListening(card, posted);
    ASSERT_NE(link, nullptr);
    auto count = [&](int msg) { return posted.Count(msg); };
    EXPECT_TRUE(testing::WaitFor([&] { return count(kMsgCallRinging) >= 3; }));
    EXPECT_EQ(RingingNumber(*link), "+441234");  // the caller comes with it
    PortClose(*link);
    EXPECT_EQ(count(kMsgCallActive), 0);
    EXPECT_EQ(count(kMsgCallListEmpty), 0);
}

TEST_F(LinkTest, ListenerRingsForAnIncomingCallWithoutRingText) {
    std::atomic<int> callPolls{0};
    FakeCard card([&](const std::string& command) {
        if (command == "AT+CLCC") {
            ++callPolls;
            return Ok("+CLCC: 1,1,4,0,0,\"+441234\",145");
        }
        return StandardCard(command);
    });
    auto link = OpenLink(card);
    auto handled = [&] {
        std::lock_guard<std::recursive_mutex> lock(sink_.mutex);
        return sink_.next;
    };
    ASSERT_TRUE(testing::WaitFor([&] { return handled() >= 1; }));
    // Three more passes of the listener find the same call ringing.
    const int polls = callPolls;
    EXPECT_TRUE(testing::WaitFor([&] { return callPolls >= polls + 3; }));
    PortClose(*link);
    EXPECT_EQ(sink_.queued.size(), 1u);  // once, not on every pass
    EXPECT_EQ(sink_.next, 1u);
}

// A poll that falls due while an exchange holds the port waits in the port's queue instead of
// looking again and again (a busy listener took a whole core while the SMS Folder read 50
// messages), and goes out as soon as the port is given back.
TEST_F(LinkTest, ListenerWaitsForAPortHeldPastItsPoll) {
    std::atomic<int> callPolls{0};
    FakeCard card([&](const std::string& command) {
        if (command == "AT+CLCC") ++callPolls;
        return StandardCard(command);
    });
    PostedMessages posted;
    auto link = OpenListening(card, posted);
    ASSERT_NE(link, nullptr);
    ASSERT_TRUE(testing::WaitFor([&] { return callPolls >= 1; }));
    ASSERT_EQ(PortLock(*link), 1);
    const int polls = callPolls;
    timespec cpuBefore{}, cpuAfter{};
    clock_gettime(CLOCK_PROCESS_CPUTIME_ID, &cpuBefore);
    // Passes come every 50 ms here: twenty fall due during the hold.
    std::this_thread::sleep_for(std::chrono::seconds(1));
    clock_gettime(CLOCK_PROCESS_CPUTIME_ID, &cpuAfter);
    const double cpuSeconds = double(cpuAfter.tv_sec - cpuBefore.tv_sec) +
                              double(cpuAfter.tv_nsec - cpuBefore.tv_nsec) / 1e9;
    EXPECT_LT(cpuSeconds, 0.15) << "the listener spun while the port was held";
    EXPECT_EQ(callPolls, polls);
    PortUnlock(*link);
    EXPECT_TRUE(testing::WaitFor([&] { return callPolls > polls; }));
    PortClose(*link);
}

}  // namespace
}  // namespace vqm
