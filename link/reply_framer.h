// Splits what the card sends during one exchange into the command's echo, the lines of the
// command's own reply and the unsolicited lines that arrive around or inside it. A line is
// classified when it ends: a tagged line ("+XXX:", "^XXX:", "*XXX:") whose tag the command
// does not carry is unsolicited, so a ring arriving while a command is typed, or a new-message
// indication inside a call-list reply, is taken out of the reply and handed on once; a name or
// a message text that merely contains such a tag is never taken for one, because tags count
// only at the start of a line. No I/O here: the transaction feeds the bytes it reads.
#pragma once

#include <cstddef>
#include <string>
#include <vector>

namespace vqm {

class ReplyFramer {
  public:
    // reply receives the reply's bytes as the card sent them (echo and unsolicited lines
    // left out), NUL-terminated, at most replySize - 1 of them; the rest is read and dropped.
    // command may be null for a read that only expects unsolicited lines.
    ReplyFramer(const char* command, char* reply, size_t replySize);

    // Continues a line that an earlier read left unfinished (the bytes read so far of it).
    void ResumeLine(const std::string& partial);

    void Feed(char byte);
    void Feed(const char* bytes, size_t count) {
        for (size_t i = 0; i < count; ++i)
            Feed(bytes[i]);
    }

    // The reply has its final result line (a result code, "+CME ERROR: n", "+CMS ERROR: n")
    // or the "> " prompt.
    bool Complete() const { return complete_; }
    // Bytes of the reply so far (not counting echo and unsolicited lines).
    unsigned Length() const { return length_; }
    // Something other than echo arrived (a reply byte or an unsolicited line).
    bool HeardAnything() const { return heard_; }
    // The whole echo of the command came back.
    bool EchoSeen() const { return echoPos_ == echo_.size() && !echo_.empty(); }
    // Echo bytes still expected (none once the reply has begun).
    bool EchoPending() const { return !echoOff_ && echoPos_ < echo_.size(); }

    // An unsolicited line is waiting to be taken, and no line is half read: once the reply is
    // complete too, the exchange ends without waiting for the card to fall silent.
    bool EventsWaiting() const { return !unsolicited_.empty() && !inLine_; }
    // Unsolicited lines completed so far, each without its line end, in arrival order.
    std::vector<std::string> TakeUnsolicited();
    // A line still being received when the exchange ended, to be resumed by the next read.
    std::string PartialLine() const;

  private:
    // Returns true when the line is kept as part of the reply.
    bool LineEnded();
    void Append(char byte);
    bool OwnTag(const std::string& line) const;

    std::string echo_;
    size_t echoPos_ = 0;
    bool echoOff_ = false;
    std::vector<std::string> tags_;  // "+CSQ", ... named in the command

    char* reply_;
    size_t replySize_;
    unsigned length_ = 0;
    unsigned lineStart_ = 0;       // where the current line's text begins in the reply
    unsigned lastContentEnd_ = 0;  // where the last kept line's text ended
    bool contentBefore_ = false;   // a reply line has been kept already
    bool skipTerminator_ = false;  // the '\n' after an unsolicited line's '\r' goes with it
    bool justEnded_ = false;       // the last byte was the '\r' ending a line
    bool foreignRun_ = false;      // a line interrupted the echo and is not read whole yet
    bool inLine_ = false;
    std::string line_;  // the current line's first bytes, for classifying it
    bool complete_ = false;
    bool heard_ = false;
    std::vector<std::string> unsolicited_;
};

// 1 when the line (without line end) is a final result of an exchange.
int IsFinalResultLine(const char* line, size_t length);

}  // namespace vqm
