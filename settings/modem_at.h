// The data-call set-up of the card's modem driver: the command line of bearer service and
// HSCSD parameters chosen by method and speed, and where the driver and the dialler find it.
#pragma once

#include <string>

namespace vqm {

class SettingsStore;

inline constexpr int kModemMethodCount = 3;  // 0 "Modem", 1 "ISDN v.110", 2 "ISDN v.120"
inline constexpr int kModemSpeedCount = 5;   // 9.6, 14.4, 19.2, 28.8, 43.2 kbit/s

// The speed list's numbers as the Modem page shows them ("9.6" ... "43.2"); nullptr outside.
const char16_t* ModemSpeedText(int speed);
// The command of a method and speed (table index method * 5 + speed); nullptr outside.
const char16_t* ModemCommand(int method, int speed);

// Where the driver's initialisation value goes.
struct ModemDriverFiles {
    // The value "3" of the driver's "Init" key lives in the file
    // <registryRoot>/Drivers/PCMCIA/Tavro_Mobile_Phones-TAVRO_CARD_PHONE-4C2D/Init/3.
    std::string registryRoot;
    // A wvdial configuration file whose section gets the command as "Init3"; empty for none.
    std::string wvdialPath;
    std::string wvdialSection = "Dialer VQMFull";
};
// $XDG_CONFIG_HOME/VQMFull/registry (~/.config/...), and $VQM_WVDIAL_CONF or ~/.wvdialrc.
ModemDriverFiles DefaultModemDriverFiles();

// The registry value file under files.registryRoot.
std::string ModemInitValuePath(const ModemDriverFiles& files);

// Stores command as "ATModemCmd", writes it followed by the four characters "<cr>" as the
// driver's value "3", and sets it as "Init3" of the wvdial section. Returns 0 on success, else the
// error number of the step that failed (the setting stays written).
int WriteModemCommand(SettingsStore& store, const ModemDriverFiles& files, const char16_t* command);

// A wvdial configuration text with "Init3 = <command>" in [section]: an existing Init3 line
// of the section is replaced, else the line follows the section's last setting, else the
// section is appended. Every other line stays as it was.
std::string WithWvdialInit3(const std::string& text, const std::string& section,
                            const std::string& command);

}  // namespace vqm
