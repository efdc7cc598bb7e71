#include "support/local_socket.h"

#include <errno.h>
#include <fcntl.h>
#include <poll.h>
#include <sys/socket.h>
#include <sys/stat.h>
#include <sys/un.h>
#include <unistd.h>

#include <algorithm>
#include <chrono>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <filesystem>
#include <vector>

namespace vqm {

namespace {

using Clock = std::chrono::steady_clock;

// A request longer than this is not one of ours; the client is dropped.
constexpr size_t kMaxRequest = 4096;
// After the program runs out of descriptors, the server waits this long before it accepts
// again rather than spin on a listening socket that stays readable.
constexpr auto kAcceptBackOff = std::chrono::milliseconds(100);

bool MakeAddress(const std::string& path, sockaddr_un* address) {
    std::memset(address, 0, sizeof *address);
    address->sun_family = AF_UNIX;
    if (path.empty() || path.size() >= sizeof address->sun_path) return false;
    std::memcpy(address->sun_path, path.c_str(), path.size() + 1);
    return true;
}

int MillisecondsLeft(Clock::time_point deadline) {
    const auto left =
        std::chrono::duration_cast<std::chrono::milliseconds>(deadline - Clock::now()).count();
    return left < 0 ? 0 : static_cast<int>(left);
}

// A non-blocking connection made by the deadline; -1 with errno set otherwise (EAGAIN or
// ETIMEDOUT when the server is there but does not take it in time).
int Connect(const std::string& path, Clock::time_point deadline) {
    sockaddr_un address;
    if (!MakeAddress(path, &address)) {
        errno = ENAMETOOLONG;
        return -1;
    }
    for (;;) {
        int fd = socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC | SOCK_NONBLOCK, 0);
        if (fd < 0) return -1;
        if (connect(fd, reinterpret_cast<sockaddr*>(&address), sizeof address) == 0) return fd;
        const int error = errno;
        if (error == EINPROGRESS) {
            pollfd p{fd, POLLOUT, 0};
            int soError = 0;
            socklen_t length = sizeof soError;
            if (poll(&p, 1, MillisecondsLeft(deadline)) > 0 &&
                getsockopt(fd, SOL_SOCKET, SO_ERROR, &soError, &length) == 0 && soError == 0)
                return fd;
            close(fd);
            errno = soError ? soError : ETIMEDOUT;
            return -1;
        }
        close(fd);
        // A full queue: a live server that is slow or stopped. Try again until the deadline.
        if (error != EAGAIN || Clock::now() >= deadline) {
            errno = error;
            return -1;
        }
        std::this_thread::sleep_for(std::min<Clock::duration>(std::chrono::milliseconds(10),
                                                              deadline - Clock::now()));
    }
}

// Writes all of text by the deadline on a non-blocking socket.
bool WriteAll(int fd, const std::string& text, Clock::time_point deadline) {
    size_t sent = 0;
    while (sent < text.size()) {
        ssize_t n = send(fd, text.data() + sent, text.size() - sent, MSG_NOSIGNAL);
        if (n > 0) {
            sent += static_cast<size_t>(n);
            continue;
        }
        if (n < 0 && errno == EINTR) continue;
        if (n < 0 && errno == EAGAIN) {
            pollfd p{fd, POLLOUT, 0};
            if (poll(&p, 1, MillisecondsLeft(deadline)) > 0) continue;
        }
        return false;
    }
    return true;
}

// The folder of the sockets: made for the user alone. A folder that another user owns is
// refused, since that user could put a socket of theirs in place of ours.
bool PrivateFolder(const std::string& folder) {
    std::error_code error;
    const bool made = std::filesystem::create_directories(folder, error);
    struct stat info {};
    if (lstat(folder.c_str(), &info) != 0 || !S_ISDIR(info.st_mode)) return false;
    if (info.st_uid != geteuid()) return false;
    // Only a folder of our own naming, or one just made, is tightened: never one like /tmp.
    const bool ours = made || std::filesystem::path(folder).filename() == "VQMFull";
    if (ours && (info.st_mode & 0777) != 0700) return chmod(folder.c_str(), 0700) == 0;
    return true;
}

bool SameUser(int fd) {
    ucred peer{};
    socklen_t length = sizeof peer;
    return getsockopt(fd, SOL_SOCKET, SO_PEERCRED, &peer, &length) == 0 &&
           peer.uid == geteuid();
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
    const std::filesystem::path folder = std::filesystem::path(path).parent_path();
    // The fallback root sits under /tmp: its own folder is the user's alone as well.
    if (folder.parent_path().filename().string().rfind("vqm-", 0) == 0 &&
        !PrivateFolder(folder.parent_path().string()))
        return false;
    if (!PrivateFolder(folder.string())) return false;
    if (ServerAnswers(path)) return false;
    unlink(path.c_str());  // left by a program that died
    int fd = socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC | SOCK_NONBLOCK, 0);
    if (fd < 0) return false;
    if (bind(fd, reinterpret_cast<sockaddr*>(&address), sizeof address) != 0 ||
        chmod(path.c_str(), 0600) != 0 || listen(fd, SOMAXCONN) != 0 ||
        pipe2(wakeFds_, O_CLOEXEC) != 0) {
        close(fd);
        unlink(path.c_str());
        return false;
    }
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
        std::string pending, unsent;
        Clock::time_point lastHeard;
    };
    std::vector<Client> clients;
    auto drop = [&](size_t i) {
        close(clients[i].fd);
        clients.erase(clients.begin() + static_cast<long>(i));
    };
    // The client idle longest makes room for a newcomer or a descriptor.
    auto dropIdlest = [&] {
        if (clients.empty()) return;
        size_t idlest = 0;
        for (size_t i = 1; i < clients.size(); ++i)
            if (clients[i].lastHeard < clients[idlest].lastHeard) idlest = i;
        drop(idlest);
    };
    // Sends what the client will take now; false when it is gone.
    auto flush = [](Client& client) {
        while (!client.unsent.empty()) {
            ssize_t n =
                send(client.fd, client.unsent.data(), client.unsent.size(), MSG_NOSIGNAL);
            if (n > 0) {
                client.unsent.erase(0, static_cast<size_t>(n));
                continue;
            }
            if (n < 0 && errno == EINTR) continue;
            return n < 0 && errno == EAGAIN;
        }
        return true;
    };
    Clock::time_point acceptAgainAt{};
    for (;;) {
        auto now = Clock::now();
        const bool accepting = now >= acceptAgainAt;
        Clock::time_point wakeAt = now + limits_.idle;
        for (const Client& client : clients)
            wakeAt = std::min(wakeAt, client.lastHeard + limits_.idle);
        if (!accepting) wakeAt = std::min(wakeAt, acceptAgainAt);

        std::vector<pollfd> fds{{wakeFds_[0], POLLIN, 0},
                                {listenFd_, static_cast<short>(accepting ? POLLIN : 0), 0}};
        for (const Client& client : clients)
            fds.push_back({client.fd,
                           static_cast<short>(POLLIN | (client.unsent.empty() ? 0 : POLLOUT)), 0});
        if (poll(fds.data(), fds.size(), MillisecondsLeft(wakeAt) + 1) < 0) {
            if (errno == EINTR) continue;
            break;
        }
        if (fds[0].revents) break;
        now = Clock::now();
        for (size_t i = clients.size(); i-- > 0;) {
            const short revents = fds[i + 2].revents;
            // Silent too long; one that spoke while a slow request held the server is kept.
            if (!revents) {
                if (now - clients[i].lastHeard >= limits_.idle) drop(i);
                continue;
            }
            Client& client = clients[i];
            bool keep = true;
            if (revents & POLLIN) {
                char buffer[4096];
                ssize_t n = recv(client.fd, buffer, sizeof buffer, 0);
                if (n > 0) {
                    client.lastHeard = now;
                    client.pending.append(buffer, static_cast<size_t>(n));
                    Serve(client.pending, client.unsent);
                    client.lastHeard = Clock::now();  // a slow request is not silence
                    keep = client.pending.size() <= kMaxRequest;
                } else {
                    keep = n < 0 && (errno == EINTR || errno == EAGAIN);
                }
            } else if (revents & (POLLERR | POLLHUP | POLLNVAL)) {
                keep = false;
            }
            // A client that asks and never reads would make the server keep its replies
            // without end; past the limit it is dropped.
            keep = keep && flush(client) && client.unsent.size() <= limits_.maxUnsent;
            if (!keep) drop(i);
        }
        if (fds[1].revents & POLLIN) {
            // Take what is queued, a bounded number at a time so clients are not starved.
            for (int taken = 0; taken < 64; ++taken) {
                int fd = accept4(listenFd_, nullptr, nullptr, SOCK_CLOEXEC | SOCK_NONBLOCK);
                if (fd < 0) {
                    if (errno == EINTR || errno == ECONNABORTED) continue;
                    if (errno == EMFILE || errno == ENFILE || errno == ENOBUFS ||
                        errno == ENOMEM) {
                        // Out of descriptors: free one for the next caller and pause.
                        dropIdlest();
                        acceptAgainAt = Clock::now() + kAcceptBackOff;
                    }
                    break;
                }
                if (!SameUser(fd)) {
                    close(fd);
                    continue;
                }
                if (clients.size() >= std::max<size_t>(limits_.maxClients, 1)) dropIdlest();
                clients.push_back({fd, {}, {}, Clock::now()});
            }
        }
    }
    for (const Client& client : clients)
        close(client.fd);
}

void LineServer::Serve(std::string& pending, std::string& unsent) {
    size_t end;
    while ((end = pending.find('\n')) != std::string::npos) {
        std::string line = pending.substr(0, end);
        pending.erase(0, end + 1);
        if (!line.empty() && line.back() == '\r') line.pop_back();
        std::string reply = handler_(line);
        // The reply is one line: a line end inside it would be read as the next reply.
        for (char& c : reply)
            if (c == '\n' || c == '\r') c = ' ';
        unsent += reply;
        unsent += '\n';
        if (unsent.size() > limits_.maxUnsent) return;  // dropped anyway: ask no more
    }
}

std::optional<std::string> SendLine(const std::string& path, const std::string& line,
                                    int timeoutMs) {
    const auto deadline = Clock::now() + std::chrono::milliseconds(timeoutMs);
    int fd = Connect(path, deadline);
    if (fd < 0) return std::nullopt;
    std::optional<std::string> reply;
    if (WriteAll(fd, line + "\n", deadline)) {
        std::string received;
        for (;;) {
            pollfd p{fd, POLLIN, 0};
            const int left = MillisecondsLeft(deadline);
            if (poll(&p, 1, left) <= 0) break;
            char buffer[512];
            ssize_t n = recv(fd, buffer, sizeof buffer, 0);
            if (n < 0 && (errno == EINTR || errno == EAGAIN)) continue;
            if (n <= 0) break;
            received.append(buffer, static_cast<size_t>(n));
            size_t end = received.find('\n');
            if (end != std::string::npos) {
                reply = received.substr(0, end);
                break;
            }
            if (received.size() > kMaxRequest) break;  // not one of ours
        }
    }
    close(fd);
    return reply;
}

bool ServerAnswers(const std::string& path, int timeoutMs) {
    int fd = Connect(path, Clock::now() + std::chrono::milliseconds(timeoutMs));
    if (fd >= 0) {
        close(fd);
        return true;
    }
    // There, but its queue stays full: alive, only busy or stopped.
    return errno == EAGAIN || errno == ETIMEDOUT;
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
