// What the benchmark programs share: the median of a run, the line floor of the link's own
// rules, and a simulated card at a given line rate with the link open to it, in a folder of
// its own that goes when the benchmark ends.
#pragma once

#include <stdlib.h>

#include <algorithm>
#include <filesystem>
#include <functional>
#include <memory>
#include <string>
#include <vector>

#include "cardsim/card_sim.h"
#include "link/link.h"
#include "support/settings_store.h"

namespace vqm::bench {

inline double Median(std::vector<double> values) {
    if (values.empty()) return 0;
    std::sort(values.begin(), values.end());
    const size_t n = values.size();
    return n % 2 ? values[n / 2] : (values[n / 2 - 1] + values[n / 2]) / 2;
}

// One exchange can be no faster than its bytes on the line (command, echo and reply, 10 bits
// a byte), the 100 ms wait for the first reply byte and the 200 ms of silence that ends it.
inline double LineFloorMs(double bytes, int baud) {
    return bytes * 10 * 1000 / baud + 100 + 200;
}

class BenchCard {
  public:
    // configure may change the card's settings, prepare fill its memory, before it powers up.
    explicit BenchCard(int baud, std::function<void(cardsim::SimConfig&)> configure = {},
                       std::function<bool(cardsim::CardSim&)> prepare = {})
        : root_(MakeFolder()) {
        cardsim::SimConfig config;
        config.baud = baud;
        config.runtimeDir = root_ + "/run";
        config.stateFile = root_ + "/card.state";
        if (configure) configure(config);
        card_ = std::make_unique<cardsim::CardSim>(config);
        settings_ = std::make_unique<SettingsStore>(root_ + "/settings.db");
        link_ = std::make_unique<Link>(*settings_, DriverRoots{root_ + "/run", root_ + "/no-tty"});
        up_ = !root_.empty() && (!prepare || prepare(*card_)) && card_->PowerUp() &&
              PortOpenDevice(*link_, card_->DevicePath().c_str());
    }
    ~BenchCard() {
        PortClose(*link_);
        card_->PowerDown();
        std::error_code ignored;
        if (!root_.empty()) std::filesystem::remove_all(root_, ignored);
    }

    bool Up() const { return up_; }
    cardsim::CardSim& Card() { return *card_; }
    Link& GetLink() { return *link_; }
    SettingsStore& Settings() { return *settings_; }
    const std::string& Folder() const { return root_; }

  private:
    static std::string MakeFolder() {
        char folder[] = "/tmp/vqm-bench-XXXXXX";
        return mkdtemp(folder) ? folder : "";
    }

    std::string root_;
    std::unique_ptr<cardsim::CardSim> card_;
    std::unique_ptr<SettingsStore> settings_;
    std::unique_ptr<Link> link_;
    bool up_ = false;
};

}  // namespace vqm::bench
