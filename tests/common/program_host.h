// The dialer and the simulated card as two programs, started as a user starts them, each with
// its own sockets in a private runtime folder. What the dialer shows is read from its --ui-log
// record; the card is driven through `vqm-cardsim ctl`, the dialer's controls through commands
// on its socket. Needs VQM_DIALER and VQM_CARDSIM defined to the programs' paths.
#pragma once

#include <gtest/gtest.h>
#include <sys/stat.h>

#include <chrono>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <optional>
#include <sstream>
#include <string>
#include <utility>

#include "support/local_socket.h"
#include "support/settings_store.h"
#include "tests/common/process.h"
#include "tests/common/temp_folder.h"
#include "tests/common/wait.h"

namespace vqm::testing {

class ProgramHost {
  public:
    static constexpr unsigned kCommand = 273;  // a menu or control click (WM_COMMAND)
    static constexpr int kExit = 40016;        // File > Exit
    static constexpr int kDigitZero = 1126;    // the DialPad's 0 key; 1..9 follow

    // ownConfig: the programs' XDG_CONFIG_HOME in the test's folder too (the Settings pages
    // write the modem's files there); without it they keep the user's.
    explicit ProgramHost(bool ownConfig = false) : ownConfig_(ownConfig) {
        // The sockets' folder, for the user alone as the programs make it.
        std::filesystem::create_directories(run_);
        chmod(run_.c_str(), 0700);
        SettingsStore settings(temp_ / "settings.db");
        SetSettingString(settings, u"PnpId", u"TAVRO_CARD_PHONE");
    }

    // The variables a user's session gives both programs, pointed into the test's folder.
    std::string Environment() const {
        return "env XDG_RUNTIME_DIR=" + (temp_ / "xdg") +
               " VQM_SETTINGS_DB=" + (temp_ / "settings.db") +
               " XDG_DATA_HOME=" + (temp_ / "data") +
               (ownConfig_ ? " XDG_CONFIG_HOME=" + (temp_ / "config") : std::string()) +
               " QT_QPA_PLATFORM=offscreen DBUS_SESSION_BUS_ADDRESS=unix:path=/nonexistent ";
    }

    // options: the card's own (--dialect, --powered, ...); returns once its socket answers.
    void StartCard(const std::string& options) {
        card_.Start(Environment() + VQM_CARDSIM + " " + options + " --state-dir " +
                    (temp_ / "state") + " >" + (temp_ / "cardsim.out") + " 2>&1");
        ASSERT_TRUE(
            WaitFor([&] { return ServerAnswers(WindowSocketPath(run_, kCompanionClass)); }));
        // Its control socket comes up beside the card manager's, not necessarily first.
        ASSERT_TRUE(WaitFor([&] { return Ctl("status").second == 0; }));
    }
    // options: the dialer's own (--answer-boxes, ...); returns once its socket answers.
    void StartDialer(const std::string& options) {
        dialer_.Start(Environment() + VQM_DIALER + " --ui-log " + (temp_ / "ui.log") + " " +
                      options + " >" + (temp_ / "dialer.out") + " 2>&1");
        ASSERT_TRUE(
            WaitFor([&] { return ServerAnswers(DialerSocket()); }, std::chrono::seconds(10)))
            << Read(temp_ / "dialer.out");
    }
    // Both programs, boxes answered OK, the card on line once it returns.
    void StartConnected(const std::string& cardOptions,
                        const std::string& dialerOptions = "--answer-boxes ok") {
        ASSERT_NO_FATAL_FAILURE(StartCard(cardOptions));
        ASSERT_NO_FATAL_FAILURE(StartDialer(dialerOptions));
        ASSERT_TRUE(LogShows("card 2 connected", std::chrono::seconds(30))) << Log();
    }
    // File > Exit while the dialer still answers, so it ends as a user ends it.
    void ExitDialer() {
        if (ServerAnswers(DialerSocket())) Command(kExit);
        dialer_.WaitExit(std::chrono::seconds(10));
    }

    std::string DialerSocket() const { return WindowSocketPath(run_, "DIALERAPP_CLASS"); }
    // A click on the dialer's control or menu item id: its answer, or nothing.
    std::optional<long> Command(int id, int timeoutMs = 2000) {
        return SendWindowMessage(DialerSocket(), kCommand, id, 0, timeoutMs);
    }
    // Output and exit status of `vqm-cardsim ctl command`.
    std::pair<std::string, int> Ctl(const std::string& command) const {
        return RunShell(Environment() + VQM_CARDSIM + " ctl " + command);
    }

    static std::string Read(const std::string& path) {
        std::ifstream file(path, std::ios::binary);
        std::ostringstream text;
        text << file.rdbuf();
        return text.str();
    }
    static size_t Occurrences(const std::string& text, const std::string& what) {
        size_t count = 0;
        for (size_t at = text.find(what); at != std::string::npos; at = text.find(what, at + 1))
            ++count;
        return count;
    }
    // The DialPad's digit keys, clicked in turn.
    void Type(const std::string& digits) {
        for (char c : digits)
            Command(kDigitZero + (c - '0'));
    }
    // `vqm-cardsim ctl status` shows text within limit.
    bool CardShows(const std::string& text,
                   std::chrono::milliseconds limit = std::chrono::seconds(20)) const {
        return WaitFor([&] { return Ctl("status").first.find(text) != std::string::npos; }, limit);
    }

    std::string Log() const { return Read(temp_ / "ui.log"); }
    // The wall-clock time (seconds since the epoch) of the occurrence'th line (from 1) of the
    // ui log that holds text; nothing when there are fewer such lines.
    std::optional<double> LogTime(const std::string& text, size_t occurrence = 1) const {
        std::istringstream lines(Log());
        std::string line;
        while (std::getline(lines, line))
            if (line.find(text) != std::string::npos && --occurrence == 0)
                return std::strtod(line.c_str(), nullptr);
        return std::nullopt;
    }
    size_t Count(const std::string& what) const { return Occurrences(Log(), what); }
    // The ui log shows text at least times times within limit.
    bool LogShows(const std::string& text,
                  std::chrono::milliseconds limit = std::chrono::seconds(20), size_t times = 1) {
        return WaitFor([&] { return Count(text) >= times; }, limit);
    }

    const TempFolder temp_;
    const std::string run_ = temp_ / "xdg/VQMFull";
    Background card_;
    Background dialer_;

  private:
    const bool ownConfig_;
};

}  // namespace vqm::testing
