// Talking to other programs of the family over per-user local sockets.
//
// A program that owns a window class (the dialer's "DIALERAPP_CLASS", the card manager's
// "VQMMCOMMANDER_CLASS") listens on <runtime root>/<class>; finding the window means that
// something answers there. Requests are text lines and every line gets one reply line, so a
// shell user can talk to a server with socat as easily as the programs do:
//   window message:  "MSG WPARAM LPARAM\n"  ->  "RESULT\n"
//   card control:    "ring +4412345\n"       ->  "OK\n" or "ERROR: reason\n"
#pragma once

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

// Serves one socket on its own thread. Clients are served in turn, one line at a time, so a
// client that connects and says nothing holds up nobody.
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

  private:
    void Run();
    void Serve(int client, std::string& pending);

    Handler handler_;
    std::string path_;
    int listenFd_ = -1;
    int wakeFds_[2] = {-1, -1};
    std::thread thread_;
};

// One request line, one reply line (without its line end); nothing when nobody answers at
// path or the reply does not come within timeoutMs.
std::optional<std::string> SendLine(const std::string& path, const std::string& line,
                                    int timeoutMs);
// True when a server accepts connections at path.
bool ServerAnswers(const std::string& path);

// The window-message form of the protocol.
using WindowProc = std::function<long(unsigned msg, long wParam, long lParam)>;
// Parses "MSG WPARAM LPARAM" and formats the procedure's result; a malformed line gets 0.
std::string AnswerWindowMessage(const std::string& line, const WindowProc& proc);
// SendMessage to another program's window: its result, or nothing when no window answers.
std::optional<long> SendWindowMessage(const std::string& path, unsigned msg, long wParam,
                                      long lParam, int timeoutMs = 10000);

}  // namespace vqm
