// The commands of vqm-phone, apart from where they run: the program runs them on a link it
// opens itself, and the dialer runs the very same ones on its own link when vqm-phone asks it
// through its socket (the port is exclusive, so only one of them may hold it). No Qt.
#pragma once

#include <atomic>
#include <condition_variable>
#include <cstdint>
#include <deque>
#include <functional>
#include <mutex>
#include <string>
#include <vector>

#include "link/event_sink.h"

namespace vqm {
struct Link;
struct SmsRecord;
class SettingsStore;
struct CallLog;
struct PhonebookCaches;

namespace phone {

// Exit codes of the program, and of every command wherever it ran.
inline constexpr int kExitDone = 0;
inline constexpr int kExitRefused = 1;  // the card said no, or a file could not be read/written
inline constexpr int kExitUsage = 2;    // the command line or its input is wrong
inline constexpr int kExitNoCard = 3;   // no card to talk to

// The longest message text a command takes in (anything longer is refused before it is read
// further, so a 10 MB stdin costs nothing); what one message holds is the Write SMS view's
// decision (messaging/write_sms.h).
inline constexpr size_t kMaxTextBytes = 4096;
// A vCard file larger than this is refused unread.
inline constexpr long long kMaxVCardFileBytes = 4 * 1024 * 1024;

enum class Verb {
    Status,
    Dial,
    HangUp,
    Answer,
    SmsList,
    SmsRead,
    SmsSend,
    SmsDelete,
    ContactsList,
    ContactsExport,
    ContactsImport,
    CallLog,
    Events,
};

// Which phonebook a contacts command means.
enum class Book { All, Sim, Card, Desktop };

struct Command {
    Verb verb = Verb::Status;
    bool json = false;
    std::string number;                // dial
    std::vector<std::string> numbers;  // sms send, as given
    std::string text;                  // sms send (UTF-8); "-" until stdin was read
    bool textFromStdin = false;
    int page = 0;   // sms list/read/delete: kPageInbox...
    int index = 0;  // sms read/delete
    Book book = Book::All;
    std::string file;  // contacts export/import
    int log = 0;       // calllog: 0 all, else kCallLogAnswered...
};

// Reads argv (without the program name) into a command: kExitDone, or kExitUsage with the
// reason in *error. Nothing here touches the card, so bad usage never costs a port opening.
int ParseCommand(const std::vector<std::string>& args, Command* command, std::string* error);
// The command's arguments again, for the dialer's socket (relative file names made absolute
// and stdin already read into the text).
std::vector<std::string> CommandArguments(const Command& command);

// False for the commands that only read the computer's own files (the call log, the desktop
// contacts, the Sent, Draft and PC folders): they run without the card.
bool NeedsCard(const Command& command);
// The checks of a command's input that need no card (the message text, the vCard file to
// import): kExitDone, or kExitUsage with the reason, before anything is sent anywhere.
int CheckInputs(const Command& command, std::string* error);

// What a command printed and how it ended.
struct Result {
    int code = kExitDone;
    std::string out;  // for stdout
    std::string err;  // for stderr
};

// The checks of a message text that need no card: kExitDone, or kExitUsage with the reason.
// *body gets the message as the Write SMS view builds it (PrepareBody), its coding 0 for
// 7-bit or 8 for UCS2; a text the view would offer to cut is refused instead, as a script
// cannot be asked.
int CheckMessageText(const std::string& utf8, SmsRecord* body, std::string* error);
// The number a recipient gives, through the Write SMS view's filter (FilterNumber); empty when
// IsValidPhoneNumber refuses it or a message could not hold it whole.
std::string RecipientNumber(const std::string& text);

// What a command runs on. callLog and caches may be null (the program makes its own).
struct Context {
    Context(Link& link, SettingsStore& settings) : link(link), settings(settings) {}
    Link& link;
    SettingsStore& settings;
    CallLog* callLog = nullptr;
    PhonebookCaches* caches = nullptr;
    std::string companionPath;  // the card manager's socket, for the power state
    // Told after a command changed the message folders or the call log, so a dialer shows it.
    std::function<void()> listsChanged;
};

// Runs a parsed command (anything but Events) on a link that is open.
Result Run(Context& context, const Command& command);

// One unsolicited event as a line of output.
struct Event {
    uint64_t sequence = 0;
    std::string kind;   // "ring", "caller", "message"
    std::string value;  // the caller's number, the message's SIM location
};
std::string FormatEvent(const Event& event, bool json);

// The events the link finds, kept in order with a sequence number each for whoever follows
// them (the program's "events" command, or vqm-phone asking the dialer). It stands in the
// link's place for an event sink and hands everything on to the sink that was there before.
class EventFeed : public EventSink {
  public:
    explicit EventFeed(Link& link, EventSink* next = nullptr) : link_(link), next_(next) {}
    int UnsolicitedScan(const char* text, int length) override;
    int QueueLine(const char* line, int length) override;
    int DispatchAll(int* rings) override;
    EventSink* Next() const { return next_; }

    // Events after sequence since, at most 200 of the newest; *last gets the newest sequence.
    std::vector<Event> Since(uint64_t since, uint64_t* last);
    // Waits at most limitMs for an event after since; true when there is one.
    bool WaitAfter(uint64_t since, int limitMs);
    uint64_t Last();

  private:
    void Take(const char* line, int length);
    Link& link_;
    EventSink* next_;
    std::mutex mutex_;
    std::condition_variable arrived_;
    std::deque<Event> events_;
    uint64_t last_ = 0;
};

// The dialer's socket: a request line carries a command, the reply line its result. Fields
// are escaped so that no blank or line end stands inside one.
inline constexpr char kRequestTag[] = "PHONE";
std::string EncodeRequest(const std::vector<std::string>& args);
// False when the line is not a phone request.
bool DecodeRequest(const std::string& line, std::vector<std::string>* args);
std::string EncodeReply(const Result& result, uint64_t cursor = 0);
bool DecodeReply(const std::string& line, Result* result, uint64_t* cursor = nullptr);

// The dialer's side of a request: parses it, runs it on the dialer's link, and answers the
// "events-since N" poll from the feed.
std::string AnswerRequest(Context& context, EventFeed* feed, const std::string& line);

}  // namespace phone
}  // namespace vqm
