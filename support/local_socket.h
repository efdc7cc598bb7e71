// Talking to other programs of the family over per-user local sockets.
//
// A program that owns a window class (the dialer's "DIALERAPP_CLASS", the card manager's
// "VQMMCOMMANDER_CLASS") listens on <runtime root>/<class>; finding the window means that
// something answers there. Requests are text lines and every line gets one reply line, so a
// shell user can talk to a server with socat as easily as the programs do:
//   window message:  "MSG WPARAM LPARAM\n"  ->  "RESULT\n"
//   card control:    "ring +4412345\n"       ->  "OK\n" or "ERROR: reason\n"
#pragma once

#include <chrono>
#include <cstddef>
#include <functional>
#include <optional>
#include <string>
#include <thread>

namespace vqm {

// $XDG_RUNTIME_DIR/VQMFull, else /tmp/vqm-<uid>/VQMFull: sockets and driver entries live here.
std::string DefaultRuntimeRoot();
std::string WindowSocketPath(const std::string& runtimeRoot, const std::string& windowClass);

inline constexpr char kCompanionClass[] = "VQMMCOMMANDER_CLASS";
// The dialer's messages to the companion.
inline constexpr unsigned kMsgCardPowerQuery = 2028;  // 0 down, 1 ready, 2 powering up
inline constexpr unsigned kMsgSimFullCleared = 2029;
inline constexpr unsigned kMsgCardPowerUp = 2030;
inline constexpr unsigned kMsgCardPowerDown = 2031;

// What one server allows its clients, so that no client, and no crowd of them, can take the
// server's thread or the program's descriptors.
struct LineServerLimits {
    size_t maxClients = 64;  // more: the one idle longest makes room
    std::chrono::milliseconds idle{30000};  // a client silent this long is dropped
    size_t maxUnsent = 64 * 1024;  // replies a client leaves unread; more and it is dropped
};

// Serves one socket on its own thread. Clients are served in turn, one line at a time, so a
// client that connects and says nothing holds up nobody. Only the user's own programs are
// served: the socket is the user's alone (mode 0600, in a folder made 0700), and a client
// whose credentials name another user is closed at once.
class LineServer {
  public:
    using Handler = std::function<std::string(const std::string& line)>;

    LineServer() = default;
    ~LineServer() { Stop(); }
    LineServer(const LineServer&) = delete;
    LineServer& operator=(const LineServer&) = delete;

    // False when another live server answers at path or the socket cannot be made. A socket
    // file left by a program that died is replaced. The handler runs on the server's thread.
    bool Start(const std::string& path, Handler handler);
    // Stops serving and removes the socket file.
    void Stop();
    bool Running() const { return listenFd_ >= 0; }
    // Before Start.
    void SetLimits(const LineServerLimits& limits) { limits_ = limits; }

  private:
    void Run();
    // Answers every whole line of pending; the replies go to unsent.
    void Serve(std::string& pending, std::string& unsent);

    Handler handler_;
    LineServerLimits limits_;
    std::string path_;
    int listenFd_ = -1;
    int wakeFds_[2] = {-1, -1};
    std::thread thread_;
};

// One request line, one reply line (without its line end); nothing when nobody answers at
// path or the reply does not come within timeoutMs. timeoutMs bounds the whole exchange, the
// connection included: a server that is stopped with its queue full cannot hold the caller.
std::optional<std::string> SendLine(const std::string& path, const std::string& line,
                                    int timeoutMs);
// True when a server accepts connections at path (or is there but too busy to take one
// within timeoutMs).
bool ServerAnswers(const std::string& path, int timeoutMs = 1000);

// The window-message form of the protocol.
using WindowProc = std::function<long(unsigned msg, long wParam, long lParam)>;
// Parses "MSG WPARAM LPARAM" and formats the procedure's result; a malformed line gets 0.
std::string AnswerWindowMessage(const std::string& line, const WindowProc& proc);
// SendMessage to another program's window: its result, or nothing when no window answers.
std::optional<long> SendWindowMessage(const std::string& path, unsigned msg, long wParam,
                                      long lParam, int timeoutMs = 10000);

}  // namespace vqm
