// A plain record of what the dialer shows a person: status lines, card state changes, message
// boxes and dialogs, one line each with the wall-clock time in seconds. Written only when the
// program is started with --ui-log; scripted runs, support requests and the start-up figures
// read it.
#pragma once

#include <cstdio>
#include <mutex>
#include <string>
#include <string_view>

namespace vqm {

class UiLog {
  public:
    UiLog() = default;
    // Appends to path; an empty path (or one that cannot be opened) records nothing.
    explicit UiLog(const std::string& path);
    ~UiLog();
    UiLog(const UiLog&) = delete;
    UiLog& operator=(const UiLog&) = delete;

    bool Enabled() const { return file_ != nullptr; }
    // "<seconds> <what> <text>", text as plain characters: line breaks become " / " so one
    // event stays one line, other control characters show as "\xNN".
    void Line(std::string_view what, std::u16string_view text = {});

  private:
    std::mutex mutex_;  // sends from worker threads may log too
    std::FILE* file_ = nullptr;
};

}  // namespace vqm
