#include "shell/stall_meter.h"

#include <time.h>

namespace vqm {

StallMeter::StallMeter(const std::string& path) {
    if (path.empty() || !(file_ = std::fopen(path.c_str(), "a"))) return;
    timer_.setTimerType(Qt::PreciseTimer);
    timer_.setInterval(kStallTickMs);
    QObject::connect(&timer_, &QTimer::timeout, [this] { Tick(); });
    last_ = std::chrono::steady_clock::now();
    timer_.start();
}

StallMeter::~StallMeter() {
    if (!file_) return;
    std::fprintf(file_, "# longest %.1f ms\n", longestMs_);
    std::fclose(file_);
}

void StallMeter::Tick() {
    const auto now = std::chrono::steady_clock::now();
    const double lateMs =
        std::chrono::duration<double, std::milli>(now - last_).count() - kStallTickMs;
    last_ = now;
    if (lateMs < kStallLoggedMs) return;
    if (lateMs > longestMs_) longestMs_ = lateMs;
    timespec wall{};
    clock_gettime(CLOCK_REALTIME, &wall);
    std::fprintf(file_, "%lld.%03ld %.1f\n", static_cast<long long>(wall.tv_sec),
                 wall.tv_nsec / 1'000'000, lateMs);
    std::fflush(file_);  // the script reads the file while the dialer runs
}

}  // namespace vqm
