// The data-call command: where WriteModemCommand puts it (the setting, the driver's value file,
// the wvdial section) and what it leaves alone.
#include "settings/modem_at.h"

#include <gtest/gtest.h>

#include <filesystem>
#include <fstream>
#include <sstream>
#include <string>

#include "support/settings_store.h"
#include "tests/common/temp_folder.h"

namespace vqm {
namespace {

namespace fs = std::filesystem;
using testing::TempFolder;

std::string ReadAll(const std::string& path) {
    std::ifstream in(path, std::ios::binary);
    std::ostringstream all;
    all << in.rdbuf();
    return all.str();
}

void WriteAll(const std::string& path, const std::string& text) {
    std::ofstream(path, std::ios::binary) << text;
}

class ModemCommandTest : public ::testing::Test {
  protected:
    ModemCommandTest() {
        files_.registryRoot = temp_ / "config/VQMFull/registry";
        files_.wvdialPath = temp_ / "wvdialrc";
    }
    std::u16string Setting() {
        char16_t text[128] = u"";
        return GetSettingString(store_, u"ATModemCmd", text, 128) ? text : u"<missing>";
    }

    TempFolder temp_;
    SettingsStore store_{temp_ / "settings.db"};
    ModemDriverFiles files_;
};

TEST_F(ModemCommandTest, IsdnV120At19200GoesToTheSettingTheDriverAndWvdial) {
    const char16_t* command = ModemCommand(2, 2);
    ASSERT_NE(command, nullptr);
    EXPECT_EQ(std::u16string(command), u"AT+CBST=51,0,1;+CHSN=3,0,0,0");
    WriteAll(files_.wvdialPath,
             "[Dialer Defaults]\nModem = /dev/ttyUSB0\nInit3 = ATZ\n\n[Dialer other]\nPhone = 1\n");

    EXPECT_EQ(WriteModemCommand(store_, files_, command), 0);
    EXPECT_EQ(Setting(), u"AT+CBST=51,0,1;+CHSN=3,0,0,0");  // no carriage return here
    const std::string valuePath = ModemInitValuePath(files_);
    EXPECT_EQ(valuePath, files_.registryRoot +
                             "/Drivers/PCMCIA/Tavro_Mobile_Phones-TAVRO_CARD_PHONE-4C2D/Init/3");
    EXPECT_EQ(ReadAll(valuePath), "AT+CBST=51,0,1;+CHSN=3,0,0,0<cr>");
    EXPECT_EQ(ReadAll(files_.wvdialPath),
              "[Dialer Defaults]\nModem = /dev/ttyUSB0\nInit3 = ATZ\n\n[Dialer other]\nPhone = 1\n"
              "\n[Dialer VQMFull]\nInit3 = AT+CBST=51,0,1;+CHSN=3,0,0,0\n");

    // A second choice replaces both values; the rest of the wvdial file stays as it was.
    EXPECT_EQ(WriteModemCommand(store_, files_, ModemCommand(1, 0)), 0);
    EXPECT_EQ(ReadAll(valuePath), "AT+CBST=71,0,1;+CHSN=1,0,0,0<cr>");
    EXPECT_EQ(ReadAll(files_.wvdialPath),
              "[Dialer Defaults]\nModem = /dev/ttyUSB0\nInit3 = ATZ\n\n[Dialer other]\nPhone = 1\n"
              "\n[Dialer VQMFull]\nInit3 = AT+CBST=71,0,1;+CHSN=1,0,0,0\n");
    for (const auto& entry : fs::recursive_directory_iterator(temp_.Path()))
        EXPECT_NE(entry.path().extension(), ".tmp") << entry.path();  // copies renamed away
}

TEST_F(ModemCommandTest, TheIsdnRowsAndTheTablesBounds) {
    // The 9.6 row of the ISDN methods has its own bearer speeds; the faster rows share one.
    EXPECT_EQ(std::u16string(ModemCommand(0, 4)), u"AT+CBST=0,0,1;+CHSN=6,0,0,0");
    EXPECT_EQ(std::u16string(ModemCommand(2, 0)), u"AT+CBST=39,0,1;+CHSN=1,0,0,0");
    EXPECT_EQ(std::u16string(ModemCommand(1, 1)), u"AT+CBST=81,0,1;+CHSN=2,0,0,0");
    EXPECT_EQ(ModemCommand(3, 0), nullptr);
    EXPECT_EQ(ModemCommand(0, 5), nullptr);
    EXPECT_EQ(ModemCommand(-1, 0), nullptr);
    EXPECT_EQ(std::u16string(ModemSpeedText(4)), u"43.2");
    EXPECT_EQ(ModemSpeedText(5), nullptr);
}

TEST_F(ModemCommandTest, ARegistryFailureKeepsTheSettingAndLeavesWvdialAlone) {
    // The registry root is a file, so its key folders cannot be made.
    fs::create_directories(temp_ / "config/VQMFull");
    WriteAll(files_.registryRoot, "not a folder");
    WriteAll(files_.wvdialPath, "[Dialer VQMFull]\nInit3 = old\n");
    EXPECT_NE(WriteModemCommand(store_, files_, ModemCommand(0, 0)), 0);
    EXPECT_EQ(Setting(), u"AT+CBST=0,0,1;+CHSN=1,0,0,0");
    EXPECT_EQ(ReadAll(files_.wvdialPath), "[Dialer VQMFull]\nInit3 = old\n");
}

TEST_F(ModemCommandTest, WithoutAWvdialFileOneIsMadeAndWithoutAPathNoneIs) {
    EXPECT_EQ(WriteModemCommand(store_, files_, ModemCommand(0, 1)), 0);
    EXPECT_EQ(ReadAll(files_.wvdialPath),
              "[Dialer VQMFull]\nInit3 = AT+CBST=0,0,1;+CHSN=2,0,0,0\n");
    fs::remove(files_.wvdialPath);
    files_.wvdialPath.clear();
    EXPECT_EQ(WriteModemCommand(store_, files_, ModemCommand(0, 2)), 0);
    EXPECT_FALSE(fs::exists(temp_ / "wvdialrc"));
    EXPECT_EQ(ReadAll(ModemInitValuePath(files_)), "AT+CBST=0,0,1;+CHSN=3,0,0,0<cr>");
}

TEST(WvdialInit3, ReplacesOrAddsOnlyItsOwnLine) {
    const std::string cmd = "AT+CBST=0,0,1;+CHSN=1,0,0,0";
    // An Init3 of the section is replaced in place, in any case of key and header, and a
    // CRLF line keeps its CR; other sections' Init3 lines stay.
    EXPECT_EQ(WithWvdialInit3("[Dialer Defaults]\nInit3 = ATZ\n[dialer vqmfull]\r\n"
                              "Init2 = ATQ0\r\n init3=old\r\n; note\r\n",
                              "Dialer VQMFull", cmd),
              "[Dialer Defaults]\nInit3 = ATZ\n[dialer vqmfull]\r\nInit2 = ATQ0\r\nInit3 = " + cmd +
                  "\r\n; note\r\n");
    // Without an Init3 the line follows the section's last setting, before the blank line.
    EXPECT_EQ(
        WithWvdialInit3("[Dialer VQMFull]\nInit2 = ATQ0\n\n[Dialer Defaults]\nBaud = 1\n",
                        "Dialer VQMFull", cmd),
        "[Dialer VQMFull]\nInit2 = ATQ0\nInit3 = " + cmd + "\n\n[Dialer Defaults]\nBaud = 1\n");
    // A commented-out Init3 is not a setting.
    EXPECT_EQ(WithWvdialInit3("[Dialer VQMFull]\n;Init3 = x", "Dialer VQMFull", cmd),
              "[Dialer VQMFull]\n;Init3 = x\nInit3 = " + cmd);
    // A missing section is appended after a blank line, a missing final newline supplied.
    EXPECT_EQ(WithWvdialInit3("Modem = /dev/ttyS0", "Dialer VQMFull", cmd),
              "Modem = /dev/ttyS0\n\n[Dialer VQMFull]\nInit3 = " + cmd + "\n");
    EXPECT_EQ(WithWvdialInit3("", "Dialer VQMFull", cmd),
              "[Dialer VQMFull]\nInit3 = " + cmd + "\n");
}

}  // namespace
}  // namespace vqm
