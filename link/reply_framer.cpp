#include "link/reply_framer.h"

#include <cstring>

namespace vqm {

namespace {

// Enough of a line to classify it and to keep an unsolicited line whole (an event record
// holds 255 bytes of text).
constexpr size_t kLineKeep = 300;

bool IsLineEnd(char c) {
    return c == '\r' || c == '\n';
}

bool IsTagChar(char c) {
    return (c >= 'A' && c <= 'Z') || (c >= 'a' && c <= 'z') || (c >= '0' && c <= '9') || c == '_' ||
           c == '-';
}

// Length of the tag ("+CSQ", "^RSSI", "*ECAV") that opens the line and is followed by ':',
// or 0 when the line does not open with one.
size_t TagLength(const std::string& line) {
    if (line.empty() || (line[0] != '+' && line[0] != '^' && line[0] != '*')) return 0;
    size_t n = 1;
    while (n < line.size() && IsTagChar(line[n]))
        ++n;
    if (n == 1 || n >= line.size() || line[n] != ':') return 0;
    return n;
}

bool StartsWith(const std::string& text, const char* prefix) {
    return text.compare(0, std::strlen(prefix), prefix) == 0;
}

}  // namespace

int IsFinalResultLine(const char* line, size_t length) {
    static const char* const kResults[] = {"OK",         "ERROR",       "BUSY",
                                           "NO CARRIER", "NO ANSWER",   "NO DIALTONE",
                                           "DELAYED",    "BLACKLISTED", "CARRIER"};
    if (!line) return 0;
    for (const char* result : kResults)
        if (length == std::strlen(result) && std::memcmp(line, result, length) == 0) return 1;
    if (length >= 7 && std::memcmp(line, "CONNECT", 7) == 0) return 1;
    for (const char* prefix : {"+CME ERROR:", "+CMS ERROR:"})
        if (length >= 11 && std::memcmp(line, prefix, 11) == 0) return 1;
    return 0;
}

ReplyFramer::ReplyFramer(const char* command, char* reply, size_t replySize)
    : reply_(reply), replySize_(reply ? replySize : 0) {
    if (reply_ && replySize_ > 0) reply_[0] = '\0';
    if (!command) return;
    echo_ = command;
    // The tags the command itself names answer it; any other tag is unsolicited.
    for (size_t i = 0; i < echo_.size(); ++i) {
        if (echo_[i] != '+' && echo_[i] != '^' && echo_[i] != '*') continue;
        size_t n = i + 1;
        while (n < echo_.size() && IsTagChar(echo_[n]))
            ++n;
        if (n > i + 1) tags_.push_back(echo_.substr(i, n - i));
        i = n - 1;
    }
    // The text of a message, sent after the "> " prompt and ended by Ctrl-Z, is answered
    // with the tag of the command that asked for it.
    if (echo_.find('\x1A') != std::string::npos) {
        tags_.push_back("+CMGS");
        tags_.push_back("+CMGW");
    }
}

void ReplyFramer::ResumeLine(const std::string& partial) {
    for (char c : partial)
        Feed(c);
}

void ReplyFramer::Append(char byte) {
    if (reply_ && length_ + 1 < replySize_) {
        reply_[length_] = byte;
        reply_[length_ + 1] = '\0';
    }
    ++length_;
}

bool ReplyFramer::OwnTag(const std::string& line) const {
    const size_t n = TagLength(line);
    for (const std::string& tag : tags_)
        if (tag.size() == n && line.compare(0, n, tag) == 0) return true;
    return false;
}

void ReplyFramer::Feed(char byte) {
    if (skipTerminator_) {
        skipTerminator_ = false;
        if (byte == '\n') return;
    }
    // The echo comes back at a line start, ahead of the reply; a line that interrupted it
    // is read whole before the echo is looked for again.
    if (!echoOff_ && echoPos_ < echo_.size() && !inLine_ && !foreignRun_ &&
        byte == echo_[echoPos_]) {
        ++echoPos_;
        justEnded_ = false;
        return;
    }
    heard_ = true;
    if (IsLineEnd(byte)) {
        if (inLine_) {
            const bool kept = LineEnded();
            justEnded_ = byte == '\r';
            if (kept)
                Append(byte);
            else
                skipTerminator_ = byte == '\r';
            return;
        }
        // A line end that is not the terminator of the line just read opens a new line:
        // until it is read whole, nothing is taken for echo.
        if (!(justEnded_ && byte == '\n')) foreignRun_ = echoPos_ < echo_.size() && !echoOff_;
        justEnded_ = false;
        Append(byte);
        return;
    }
    justEnded_ = false;
    if (!inLine_) {
        // The reply opens with one line end: more before its first line are the leftovers
        // of an echo or a line taken out.
        if (!contentBefore_ && length_ > 2 && length_ < replySize_ && reply_[length_ - 2] == '\r' &&
            reply_[length_ - 1] == '\n') {
            reply_[0] = '\r';
            reply_[1] = '\n';
            reply_[2] = '\0';
            length_ = 2;
        }
        inLine_ = true;
        lineStart_ = length_;
        line_.clear();
    }
    if (line_.size() < kLineKeep) line_ += byte;
    Append(byte);
    if (line_.size() == 2 && line_[0] == '>' && line_[1] == ' ') {
        complete_ = true;  // the card waits for the text of a message
        echoOff_ = true;
    }
}

bool ReplyFramer::LineEnded() {
    inLine_ = false;
    foreignRun_ = false;
    const bool dialling = StartsWith(echo_, "ATD") || StartsWith(echo_, "ATA");
    const bool tagged = TagLength(line_) > 0;
    const bool finalResult = IsFinalResultLine(line_.data(), line_.size()) != 0;
    // A modem that reports rings and call ends as bare results does so at any time; only
    // a dial or an answer has them as its own result.
    const bool bareEvent =
        !dialling && (line_ == "RING" || (line_ == "NO CARRIER" && !contentBefore_));
    const bool unsolicited = bareEvent || (tagged && !finalResult && !OwnTag(line_));
    if (!unsolicited) {
        contentBefore_ = true;
        echoOff_ = true;  // the reply has begun: what follows is no echo
        if (finalResult) complete_ = true;
        lastContentEnd_ = length_;
        return true;
    }
    unsolicited_.push_back(line_);
    // Take the line out of the reply with the line ends that led to it, keeping the
    // terminator of the reply line before it, so the reply reads as if it had not come.
    unsigned cut = lineStart_;
    if (contentBefore_) {
        if (cut > lastContentEnd_ + 2) cut = lastContentEnd_ + 2;
    } else {
        cut = 0;
    }
    length_ = cut;
    if (reply_ && replySize_ > 0) reply_[cut < replySize_ ? cut : replySize_ - 1] = '\0';
    return false;
}

std::vector<std::string> ReplyFramer::TakeUnsolicited() {
    std::vector<std::string> lines;
    lines.swap(unsolicited_);
    return lines;
}

std::string ReplyFramer::PartialLine() const {
    // The prompt is the last thing of its reply, not the start of a line to come.
    if (!inLine_ || (line_.size() == 2 && line_[0] == '>' && line_[1] == ' ')) return {};
    return line_;
}

}  // namespace vqm
