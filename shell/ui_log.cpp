#include "shell/ui_log.h"

#include <time.h>

#include "support/text.h"

namespace vqm {

UiLog::UiLog(const std::string& path) {
    if (!path.empty()) file_ = std::fopen(path.c_str(), "a");
}

UiLog::~UiLog() {
    if (file_) std::fclose(file_);
}

void UiLog::Line(std::string_view what, std::u16string_view text) {
    if (!file_) return;
    timespec now{};
    clock_gettime(CLOCK_REALTIME, &now);
    char stamp[32];
    std::snprintf(stamp, sizeof stamp, "%lld.%03ld ", static_cast<long long>(now.tv_sec),
                  now.tv_nsec / 1'000'000);
    std::string line = stamp;
    line += what;
    if (!text.empty()) {
        line += ' ';
        for (char c : Utf16ToUtf8(std::u16string(text))) {
            const auto byte = static_cast<unsigned char>(c);
            if (c == '\n') {
                line += " / ";
            } else if (c == '\r') {  // dropped: "\r\n" is one break
            } else if (byte < 0x20 || byte == 0x7F) {
                // A caller id or message with terminal escapes must not rewrite the screen
                // of whoever reads the log.
                char escaped[8];
                std::snprintf(escaped, sizeof escaped, "\\x%02x", byte);
                line += escaped;
            } else {
                line += c;
            }
        }
    }
    line += '\n';
    std::lock_guard<std::mutex> lock(mutex_);
    std::fputs(line.c_str(), file_);
    std::fflush(file_);  // a crash must not take the last lines with it
}

}  // namespace vqm
