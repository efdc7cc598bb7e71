#include "settings/modem_at.h"

#include <cctype>
#include <cerrno>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <sstream>
#include <system_error>
#include <vector>

#include "support/files.h"
#include "support/settings_store.h"
#include "support/text.h"

namespace vqm {

namespace {

namespace fs = std::filesystem;

const char16_t* const kSpeedTexts[kModemSpeedCount] = {u"9.6", u"14.4", u"19.2", u"28.8", u"43.2"};

// By method, then speed. The 9.6 row of both ISDN methods uses bearer speeds 71 and 39 while
// the faster rows use 81 and 51; the driver was tuned against exactly these lines.
const char16_t* const kCommands[kModemMethodCount * kModemSpeedCount] = {
    u"AT+CBST=0,0,1;+CHSN=1,0,0,0",  u"AT+CBST=0,0,1;+CHSN=2,0,0,0",
    u"AT+CBST=0,0,1;+CHSN=3,0,0,0",  u"AT+CBST=0,0,1;+CHSN=4,0,0,0",
    u"AT+CBST=0,0,1;+CHSN=6,0,0,0",  u"AT+CBST=71,0,1;+CHSN=1,0,0,0",
    u"AT+CBST=81,0,1;+CHSN=2,0,0,0", u"AT+CBST=81,0,1;+CHSN=3,0,0,0",
    u"AT+CBST=81,0,1;+CHSN=4,0,0,0", u"AT+CBST=81,0,1;+CHSN=6,0,0,0",
    u"AT+CBST=39,0,1;+CHSN=1,0,0,0", u"AT+CBST=51,0,1;+CHSN=2,0,0,0",
    u"AT+CBST=51,0,1;+CHSN=3,0,0,0", u"AT+CBST=51,0,1;+CHSN=4,0,0,0",
    u"AT+CBST=51,0,1;+CHSN=6,0,0,0",
};

constexpr char kDriverInitKey[] = "Drivers/PCMCIA/Tavro_Mobile_Phones-TAVRO_CARD_PHONE-4C2D/Init";
constexpr char kDriverInitValue[] = "3";

std::string EnvOr(const char* name, const std::string& fallback) {
    const char* value = std::getenv(name);
    return value && *value ? value : fallback;
}

std::string Trim(const std::string& text) {
    const size_t first = text.find_first_not_of(" \t\r");
    if (first == std::string::npos) return {};
    const size_t last = text.find_last_not_of(" \t\r");
    return text.substr(first, last - first + 1);
}

bool SameIgnoringCase(const std::string& a, const std::string& b) {
    if (a.size() != b.size()) return false;
    for (size_t i = 0; i < a.size(); ++i)
        if (std::tolower(static_cast<unsigned char>(a[i])) !=
            std::tolower(static_cast<unsigned char>(b[i])))
            return false;
    return true;
}

bool IsSectionHeader(const std::string& line) {
    const std::string trimmed = Trim(line);
    return !trimmed.empty() && trimmed.front() == '[';
}

// The key of a "Key = Value" line; empty for headers, comments and blank lines.
std::string KeyOf(const std::string& line) {
    const std::string trimmed = Trim(line);
    if (trimmed.empty() || trimmed[0] == '[' || trimmed[0] == ';' || trimmed[0] == '#') return {};
    const size_t equals = trimmed.find('=');
    return equals == std::string::npos ? std::string() : Trim(trimmed.substr(0, equals));
}

int LastError(int fallback) {
    return errno != 0 ? errno : fallback;
}

}  // namespace

const char16_t* ModemSpeedText(int speed) {
    return speed >= 0 && speed < kModemSpeedCount ? kSpeedTexts[speed] : nullptr;
}

const char16_t* ModemCommand(int method, int speed) {
    if (method < 0 || method >= kModemMethodCount || speed < 0 || speed >= kModemSpeedCount)
        return nullptr;
    return kCommands[method * kModemSpeedCount + speed];
}

ModemDriverFiles DefaultModemDriverFiles() {
    const std::string home = EnvOr("HOME", "/tmp");
    ModemDriverFiles files;
    files.registryRoot = EnvOr("XDG_CONFIG_HOME", home + "/.config") + "/VQMFull/registry";
    files.wvdialPath = EnvOr("VQM_WVDIAL_CONF", home + "/.wvdialrc");
    return files;
}

std::string ModemInitValuePath(const ModemDriverFiles& files) {
    return files.registryRoot + "/" + kDriverInitKey + "/" + kDriverInitValue;
}

std::string WithWvdialInit3(const std::string& text, const std::string& section,
                            const std::string& command) {
    std::vector<std::string> lines;
    std::string line;
    std::istringstream in(text);
    while (std::getline(in, line))
        lines.push_back(line);
    const bool endsWithNewline = !text.empty() && text.back() == '\n';
    const std::string header = "[" + section + "]";
    const std::string setting = "Init3 = " + command;

    size_t at = 0;
    while (at < lines.size() && !SameIgnoringCase(Trim(lines[at]), header))
        ++at;
    if (at == lines.size()) {
        std::string out = text;
        if (!out.empty() && !endsWithNewline) out += '\n';
        // A blank line keeps the new section apart from the one before it.
        if (!out.empty() && out != "\n" && out.substr(out.size() - 2) != "\n\n") out += '\n';
        return out + header + "\n" + setting + "\n";
    }
    size_t lastSetting = at;
    size_t i = at + 1;
    for (; i < lines.size() && !IsSectionHeader(lines[i]); ++i) {
        if (SameIgnoringCase(KeyOf(lines[i]), "Init3")) {
            const bool crlf = !lines[i].empty() && lines[i].back() == '\r';
            lines[i] = setting + (crlf ? "\r" : "");
            lastSetting = lines.size();  // replaced: nothing to insert
            break;
        }
        if (!Trim(lines[i]).empty()) lastSetting = i;
    }
    if (lastSetting < lines.size()) {
        const bool crlf = !lines[at].empty() && lines[at].back() == '\r';
        lines.insert(lines.begin() + static_cast<long>(lastSetting) + 1,
                     setting + (crlf ? "\r" : ""));
    }
    std::string out;
    for (size_t k = 0; k < lines.size(); ++k)
        out += (k > 0 ? "\n" : "") + lines[k];
    return endsWithNewline ? out + "\n" : out;
}

int WriteModemCommand(SettingsStore& store, const ModemDriverFiles& files,
                      const char16_t* command) {
    if (!command) return EINVAL;
    SetSettingString(store, u"ATModemCmd", command);

    // The driver's value carries the four characters "<cr>" after the command, as the driver
    // expects to find them; it turns them into the line end itself.
    const std::string text = Utf16ToUtf8(command);
    const std::string valuePath = ModemInitValuePath(files);
    std::error_code error;
    fs::create_directories(fs::path(valuePath).parent_path(), error);
    if (error) return error.value();
    errno = 0;
    if (!ReplaceFile(valuePath, text + "<cr>")) return LastError(EIO);

    if (files.wvdialPath.empty()) return 0;
    std::string current;
    if (fs::exists(files.wvdialPath, error)) {
        // A file we cannot read is left alone rather than replaced by our one section.
        std::ifstream in(files.wvdialPath, std::ios::binary);
        if (!in) return EACCES;
        std::ostringstream all;
        all << in.rdbuf();
        current = all.str();
    }
    errno = 0;
    // wvdial ends every init string with its own carriage return.
    if (!ReplaceFile(files.wvdialPath, WithWvdialInit3(current, files.wvdialSection, text)))
        return LastError(EIO);
    return 0;
}

}  // namespace vqm
