// How long the window's thread is kept from its event loop, for the figures: a 5 ms timer on
// that thread, and every firing that comes late by kStallLoggedMs or more is appended to a file
// as "<wall-clock seconds> <ms late>" (the clock of the ui log, so that a run's stalls line up
// with what it showed). Off unless vqm-dialer is started with --stall-log; the timer then
// wakes the thread 200 times a second, so the idle figures are taken without it.
#pragma once

#include <QTimer>
#include <chrono>
#include <cstdio>
#include <string>

namespace vqm {

inline constexpr int kStallTickMs = 5;
inline constexpr int kStallLoggedMs = 2;

class StallMeter {
  public:
    // An empty path (or one that cannot be opened) measures nothing.
    explicit StallMeter(const std::string& path);
    ~StallMeter();
    StallMeter(const StallMeter&) = delete;
    StallMeter& operator=(const StallMeter&) = delete;

  private:
    void Tick();

    std::FILE* file_ = nullptr;
    QTimer timer_;
    std::chrono::steady_clock::time_point last_;
    double longestMs_ = 0;
};

}  // namespace vqm
