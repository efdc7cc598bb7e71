// Finding the card's serial port among the machine's active serial drivers.
//
// The entries are walked in this order, and the first whose identity contains the "PnpId"
// setting (case-sensitive) is the card:
//   1. runtime entries <runtimeRoot>/Drivers/Active/<key>/ with the files "PnpId" and "Name"
//      (the simulated card registers itself there while powered), sorted by key;
//   2. the machine's serial devices, /sys/class/tty/<tty> with a "device" link, sorted by
//      name; the identity is the device's modalias followed by the USB vendor and product ids
//      and the manufacturer and product strings where the device has them, the name /dev/<tty>.
#pragma once

#include <cstddef>
#include <string>
#include <vector>

namespace vqm {

class SettingsStore;

struct DriverRoots {
    std::string runtimeRoot;  // DefaultRuntimeRoot()
    std::string sysClassTty;  // /sys/class/tty
};
DriverRoots DefaultDriverRoots();

struct ActiveDriver {
    std::string key;
    std::string pnpId;  // identity text
    std::string name;   // device to open
};

std::vector<ActiveDriver> ListActiveDrivers(const DriverRoots& roots);

// 1 when the card's driver is active.
int CardPresent(SettingsStore& settings, const DriverRoots& roots);
// Prints every active driver as "key<TAB>identity<TAB>device", marking the card's.
void PrintActiveDrivers(SettingsStore& settings, const DriverRoots& roots);
// Writes the card's device name (NUL-terminated, within nameSize) and returns 1, or 0.
int FindCardPort(SettingsStore& settings, const DriverRoots& roots, char* name, size_t nameSize);

}  // namespace vqm
