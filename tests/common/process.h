// Running the project's programs from tests as a user runs them: a shell command's output and
// exit status, a program left running in the background, and polling for a condition.
#pragma once

#include <signal.h>
#include <sys/wait.h>
#include <unistd.h>

#include <chrono>
#include <cstdio>
#include <string>
#include <thread>
#include <utility>

#include "tests/common/wait.h"

namespace vqm::testing {

// Output (stdout and stderr) and exit status of a shell command.
inline std::pair<std::string, int> RunShell(const std::string& command) {
    std::string output;
    FILE* pipe = popen((command + " 2>&1").c_str(), "r");
    char buffer[512];
    while (pipe && std::fgets(buffer, sizeof buffer, pipe))
        output += buffer;
    const int status = pipe ? pclose(pipe) : -1;
    return {output, WIFEXITED(status) ? WEXITSTATUS(status) : -1};
}

// A program started through the shell (so the command may set variables and redirect), ended
// with SIGTERM when the test is done with it.
class Background {
  public:
    Background() = default;
    explicit Background(const std::string& command) { Start(command); }
    ~Background() { Stop(); }
    Background(const Background&) = delete;
    Background& operator=(const Background&) = delete;

    void Start(const std::string& command) {
        pid_ = fork();
        if (pid_ == 0) {
            execl("/bin/sh", "sh", "-c", ("exec " + command).c_str(), nullptr);
            _exit(127);
        }
    }
    pid_t Pid() const { return pid_; }
    // The exit status once the program has ended by itself within limit; -1 if it has not
    // (it keeps running) or did not exit normally.
    int WaitExit(std::chrono::milliseconds limit) {
        int status = 0;
        const bool ended =
            WaitFor([&] { return pid_ <= 0 || waitpid(pid_, &status, WNOHANG) == pid_; }, limit);
        if (!ended || pid_ <= 0) return -1;
        pid_ = -1;
        return WIFEXITED(status) ? WEXITSTATUS(status) : -1;
    }
    // True while the program has not ended; a program that ended (a crash too) is reaped and
    // its wait status kept for EndedBy().
    bool Running() {
        if (pid_ <= 0) return false;
        int status = 0;
        if (waitpid(pid_, &status, WNOHANG) != pid_) return true;
        ended_ = status;
        pid_ = -1;
        return false;
    }
    // How a program Running() found ended: "exit N", "signal N", or "" while not known.
    std::string EndedBy() const {
        if (ended_ < 0) return "";
        if (WIFSIGNALED(ended_)) return "signal " + std::to_string(WTERMSIG(ended_));
        return "exit " + std::to_string(WEXITSTATUS(ended_));
    }
    // Sends SIGTERM and waits: the exit status, or -1.
    int Stop() {
        if (pid_ <= 0) return -1;
        kill(pid_, SIGTERM);
        int status = 0;
        waitpid(pid_, &status, 0);
        pid_ = -1;
        return WIFEXITED(status) ? WEXITSTATUS(status) : -1;
    }

  private:
    pid_t pid_ = -1;
    int ended_ = -1;
};

}  // namespace vqm::testing
