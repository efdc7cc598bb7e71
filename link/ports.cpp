#include "link/ports.h"

#include <algorithm>
#include <cstdio>
#include <cstring>
#include <filesystem>
#include <fstream>

#include "support/local_socket.h"
#include "support/settings_store.h"
#include "support/text.h"

namespace vqm {

namespace fs = std::filesystem;

namespace {

// First line of a small text file, without its line end; empty when it cannot be read.
std::string ReadLine(const fs::path& path) {
    std::ifstream file(path);
    std::string line;
    if (file) std::getline(file, line);
    while (!line.empty() && (line.back() == '\n' || line.back() == '\r'))
        line.pop_back();
    return line;
}

std::vector<std::string> SortedChildren(const fs::path& folder) {
    std::vector<std::string> names;
    std::error_code error;
    for (fs::directory_iterator it(folder, error), end; !error && it != end; it.increment(error))
        names.push_back(it->path().filename().string());
    std::sort(names.begin(), names.end());
    return names;
}

std::string SysfsIdentity(const fs::path& device) {
    std::string identity = ReadLine(device / "modalias");
    // A USB serial device keeps its ids and strings a level or two above the tty's device.
    std::error_code error;
    fs::path at = fs::canonical(device, error);
    for (int level = 0; !error && level < 4 && !at.empty() && at != at.root_path(); ++level) {
        if (fs::exists(at / "idVendor", error)) {
            for (const char* file : {"idVendor", "idProduct", "manufacturer", "product"}) {
                std::string value = ReadLine(at / file);
                if (!value.empty()) identity += (identity.empty() ? "" : " ") + value;
            }
            break;
        }
        at = at.parent_path();
    }
    return identity;
}

// The walk shared by the presence check and the port look-up.
bool FindCard(SettingsStore& settings, const DriverRoots& roots, ActiveDriver* found) {
    char16_t wanted[256];
    if (!GetSettingString(settings, u"PnpId", wanted, 256) || wanted[0] == u'\0') return false;
    const std::string pnpId = Utf16ToUtf8(wanted);
    for (ActiveDriver& driver : ListActiveDrivers(roots)) {
        if (driver.pnpId.find(pnpId) != std::string::npos) {
            *found = std::move(driver);
            return true;
        }
    }
    return false;
}

}  // namespace

DriverRoots DefaultDriverRoots() {
    return DriverRoots{DefaultRuntimeRoot(), "/sys/class/tty"};
}

std::vector<ActiveDriver> ListActiveDrivers(const DriverRoots& roots) {
    std::vector<ActiveDriver> drivers;
    const fs::path active = fs::path(roots.runtimeRoot) / "Drivers" / "Active";
    for (const std::string& key : SortedChildren(active)) {
        ActiveDriver driver{key, ReadLine(active / key / "PnpId"), ReadLine(active / key / "Name")};
        if (!driver.name.empty()) drivers.push_back(std::move(driver));
    }
    std::error_code error;
    for (const std::string& tty : SortedChildren(roots.sysClassTty)) {
        const fs::path device = fs::path(roots.sysClassTty) / tty / "device";
        if (!fs::exists(device, error)) continue;  // virtual consoles and ptys have none
        drivers.push_back(ActiveDriver{tty, SysfsIdentity(device), "/dev/" + tty});
    }
    return drivers;
}

int CardPresent(SettingsStore& settings, const DriverRoots& roots) {
    ActiveDriver driver;
    return FindCard(settings, roots, &driver) ? 1 : 0;
}

int FindCardPort(SettingsStore& settings, const DriverRoots& roots, char* name, size_t nameSize) {
    ActiveDriver driver;
    if (!name || !FindCard(settings, roots, &driver) || driver.name.size() + 1 > nameSize) return 0;
    std::memcpy(name, driver.name.c_str(), driver.name.size() + 1);
    return 1;
}

void PrintActiveDrivers(SettingsStore& settings, const DriverRoots& roots) {
    char card[256] = "";
    FindCardPort(settings, roots, card, sizeof card);
    for (const ActiveDriver& driver : ListActiveDrivers(roots))
        std::printf("%s\t%s\t%s%s\n", driver.key.c_str(), driver.pnpId.c_str(), driver.name.c_str(),
                    driver.name == card ? "\t(the card)" : "");
}

}  // namespace vqm
