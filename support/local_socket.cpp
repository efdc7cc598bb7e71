#include "support/local_socket.h"

#include <errno.h>
#include <fcntl.h>
#include <poll.h>
#include <sys/socket.h>
#include <sys/stat.h>
#include <sys/un.h>
#include <unistd.h>

#include <chrono>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <filesystem>
#include <vector>

namespace vqm {

namespace {

// A request longer than this is not one of ours; the client is dropped.
constexpr size_t kMaxRequest = 4096;

bool MakeAddress(const std::string& path, sockaddr_un* address) {
    std::memset(address, 0, sizeof *address);
    address->sun_family = AF_UNIX;
    if (path.empty() || path.size() >= sizeof address->sun_path) return false;
    std::memcpy(address->sun_path, path.c_str(), path.size() + 1);
    return true;
}

int Connect(const std::string& path) {
    sockaddr_un address;
    if (!MakeAddress(path, &address)) return -1;
    int fd = socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0);
    if (fd < 0) return -1;
    if (connect(fd, reinterpret_cast<sockaddr*>(&address), sizeof address) != 0) {
        close(fd);
        return -1;
    }
    return fd;
}

bool WriteAll(int fd, const std::string& text) {
    size_t sent = 0;
    while (sent < text.size()) {
        ssize_t n = send(fd, text.data() + sent, text.size() - sent, MSG_NOSIGNAL);
        if (n < 0 && errno == EINTR) continue;
        if (n <= 0) return false;
        sent += static_cast<size_t>(n);
    }
    return true;
}

}  // namespace

std::string DefaultRuntimeRoot() {
    const char* runtime = std::getenv("XDG_RUNTIME_DIR");
    return runtime && *runtime ? std::string(runtime) + "/VQMFull"
                               : "/tmp/vqm-" + std::to_string(getuid()) + "/VQMFull";
}

std::string WindowSocketPath(const std::string& runtimeRoot, const std::string& windowClass) {
    return runtimeRoot + "/" + windowClass;
}

bool LineServer::Start(const std::string& path, Handler handler) {
    if (Running()) return false;
    sockaddr_un address;
    if (!MakeAddress(path, &address)) return false;
    std::error_code error;
    std::filesystem::create_directories(std::filesystem::path(path).parent_path(), error);
    if (ServerAnswers(path)) return false;
    unlink(path.c_str());  // left by a program that died
    int fd = socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0);
    if (fd < 0) return false;
    if (bind(fd, reinterpret_cast<sockaddr*>(&address), sizeof address) != 0 ||
        listen(fd, 16) != 0 || pipe2(wakeFds_, O_CLOEXEC) != 0) {
        close(fd);
        return false;
    }
    chmod(path.c_str(), 0600);  // the user's own programs only
    path_ = path;
    handler_ = std::move(handler);
    listenFd_ = fd;
    thread_ = std::thread([this] { Run(); });
    return true;
}

void LineServer::Stop() {
    if (!Running()) return;
    char wake = 1;
    (void)!write(wakeFds_[1], &wake, 1);
    thread_.join();
    close(listenFd_);
    close(wakeFds_[0]);
    close(wakeFds_[1]);
    listenFd_ = wakeFds_[0] = wakeFds_[1] = -1;
    unlink(path_.c_str());
}

void LineServer::Run() {
    struct Client {
        int fd;
        std::string pending;
    };
    std::vector<Client> clients;
    for (;;) {
        std::vector<pollfd> fds{{wakeFds_[0], POLLIN, 0}, {listenFd_, POLLIN, 0}};
        for (const Client& client : clients)
            fds.push_back({client.fd, POLLIN, 0});
        if (poll(fds.data(), fds.size(), -1) < 0) {
            if (errno == EINTR) continue;
            break;
        }
        if (fds[0].revents) break;
        for (size_t i = clients.size(); i-- > 0;) {
            if (!fds[i + 2].revents) continue;
            char buffer[512];
            ssize_t n = recv(clients[i].fd, buffer, sizeof buffer, 0);
            bool keep = n > 0 || (n < 0 && errno == EINTR);
            if (n > 0) {
                clients[i].pending.append(buffer, static_cast<size_t>(n));
                Serve(clients[i].fd, clients[i].pending);
                keep = clients[i].pending.size() <= kMaxRequest;
            }
            if (!keep) {
                close(clients[i].fd);
                clients.erase(clients.begin() + static_cast<long>(i));
            }
        }
        if (fds[1].revents & POLLIN) {
            int client = accept4(listenFd_, nullptr, nullptr, SOCK_CLOEXEC);
            if (client >= 0) clients.push_back({client, {}});
        }
    }
    for (const Client& client : clients)
        close(client.fd);
}

void LineServer::Serve(int client, std::string& pending) {
    size_t end;
    while ((end = pending.find('\n')) != std::string::npos) {
        std::string line = pending.substr(0, end);
        pending.erase(0, end + 1);
        if (!line.empty() && line.back() == '\r') line.pop_back();
        std::string reply = handler_(line);
        // The reply is one line: a line end inside it would be read as the next reply.
        for (char& c : reply)
            if (c == '\n' || c == '\r') c = ' ';
        if (!WriteAll(client, reply + "\n")) return;
    }
}

std::optional<std::string> SendLine(const std::string& path, const std::string& line,
                                    int timeoutMs) {
    int fd = Connect(path);
    if (fd < 0) return std::nullopt;
    std::optional<std::string> reply;
    if (WriteAll(fd, line + "\n")) {
        const auto deadline =
            std::chrono::steady_clock::now() + std::chrono::milliseconds(timeoutMs);
        std::string received;
        for (;;) {
            const auto left = std::chrono::duration_cast<std::chrono::milliseconds>(
                deadline - std::chrono::steady_clock::now());
            pollfd p{fd, POLLIN, 0};
            if (left.count() < 0 || poll(&p, 1, static_cast<int>(left.count())) <= 0) break;
            char buffer[512];
            ssize_t n = recv(fd, buffer, sizeof buffer, 0);
            if (n <= 0) break;
            received.append(buffer, static_cast<size_t>(n));
            size_t end = received.find('\n');
            if (end != std::string::npos) {
                reply = received.substr(0, end);
                break;
            }
        }
    }
    close(fd);
    return reply;
}

bool ServerAnswers(const std::string& path) {
    int fd = Connect(path);
    if (fd < 0) return false;
    close(fd);
    return true;
}

std::string AnswerWindowMessage(const std::string& line, const WindowProc& proc) {
    unsigned msg = 0;
    long wParam = 0, lParam = 0;
    int used = 0;
    if (std::sscanf(line.c_str(), "%u %ld %ld%n", &msg, &wParam, &lParam, &used) != 3 ||
        line.find_first_not_of(" \t", static_cast<size_t>(used)) != std::string::npos)
        return "0";
    return std::to_string(proc(msg, wParam, lParam));
}

std::optional<long> SendWindowMessage(const std::string& path, unsigned msg, long wParam,
                                      long lParam, int timeoutMs) {
    std::optional<std::string> reply = SendLine(
        path, std::to_string(msg) + " " + std::to_string(wParam) + " " + std::to_string(lParam),
        timeoutMs);
    if (!reply) return std::nullopt;
    char* end = nullptr;
    long result = std::strtol(reply->c_str(), &end, 10);
    if (end == reply->c_str()) return std::nullopt;
    return result;
}

}  // namespace vqm
