// vqm-settings: reads and writes the dialer's settings store from the command line, for the
// installer, the companion program and users.
#include <cerrno>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <string>
#include <vector>

#include "support/settings_store.h"
#include "support/settings_table.h"
#include "support/text.h"

namespace {

const char kUsage[] =
    "Usage: vqm-settings [--db PATH] COMMAND\n"
    "Reads and writes the VQM Dialer settings store.\n"
    "\n"
    "Commands:\n"
    "  get NAME                    print the value of NAME\n"
    "  set NAME VALUE --int|--str  store VALUE as an integer or a string\n"
    "  list                        print every stored value: name, type, value\n"
    "\n"
    "Options:\n"
    "  --db PATH   the store to use (default: $VQM_SETTINGS_DB, else\n"
    "              $XDG_CONFIG_HOME/VQMFull/settings.db)\n"
    "  --help      show this text\n"
    "  --version   show the program's version\n"
    "\n"
    "A name keeps one type. Without --int or --str, set uses the type the name already has.\n"
    "Integers are 32-bit: -2147483648 to 4294967295 (values above 2147483647 are kept as\n"
    "their signed form, so 4294967295 reads back as -1).\n";

int Fail(const std::string& message) {
    std::fprintf(stderr, "vqm-settings: %s\n", message.c_str());
    return 1;
}

// Parses a whole decimal number in the 32-bit range (signed or unsigned); false otherwise.
bool ParseInteger(const std::string& text, int32_t* value) {
    if (text.empty()) return false;
    errno = 0;
    char* end = nullptr;
    long long parsed = std::strtoll(text.c_str(), &end, 10);
    if (errno != 0 || *end != '\0' || end == text.c_str()) return false;
    if (parsed < INT32_MIN || parsed > static_cast<long long>(UINT32_MAX)) return false;
    *value = static_cast<int32_t>(static_cast<uint32_t>(parsed));
    return true;
}

const char* TypeName(bool isInt) {
    return isInt ? "integer" : "string";
}

}  // namespace

int main(int argc, char** argv) {
    std::string dbPath;
    std::string typeFlag;
    std::vector<std::string> words;
    for (int i = 1; i < argc; ++i) {
        std::string arg = argv[i];
        if (arg == "--help" || arg == "-h") {
            std::fputs(kUsage, stdout);
            return 0;
        } else if (arg == "--version") {
            std::puts("vqm-settings 2.01");
            return 0;
        } else if (arg == "--db") {
            if (i + 1 >= argc) return Fail("--db needs a path");
            dbPath = argv[++i];
        } else if (arg == "--int" || arg == "--str") {
            if (!typeFlag.empty() && typeFlag != arg)
                return Fail("give only one of --int and --str");
            typeFlag = arg;
        } else {
            words.push_back(arg);
        }
    }
    if (words.empty()) {
        std::fputs(kUsage, stderr);
        return 2;
    }
    const std::string& command = words[0];
    const size_t expected = command == "get" ? 2 : command == "set" ? 3 : command == "list" ? 1 : 0;
    if (expected == 0) return Fail("unknown command '" + command + "' (see --help)");
    if (words.size() != expected)
        return Fail("'" + command + "' takes " + std::to_string(expected - 1) +
                    " argument(s) (see --help)");

    vqm::SettingsStore store(dbPath.empty() ? vqm::DefaultSettingsPath() : dbPath);
    if (!store.IsOpen())
        return Fail("cannot open the settings store " + store.Path() + ": " + store.OpenError());

    if (command == "list") {
        for (const auto& entry : store.List()) {
            bool isInt = entry.type == vqm::SettingsStore::Type::Int;
            std::printf("%s\t%s\t%s\n", vqm::Utf16ToUtf8(entry.name).c_str(), isInt ? "int" : "str",
                        isInt ? std::to_string(entry.intValue).c_str()
                              : vqm::Utf16ToUtf8(entry.text).c_str());
        }
        return 0;
    }

    const std::string& name = words[1];
    const std::u16string wideName = vqm::Utf8ToUtf16(name);
    const auto stored = store.TypeOf(wideName.c_str());

    if (command == "get") {
        if (stored == vqm::SettingsStore::Type::Missing)
            return Fail("no setting named '" + name + "'");
        if (stored == vqm::SettingsStore::Type::Int) {
            int32_t value = 0;
            if (!vqm::GetSettingInt(store, wideName.c_str(), &value))
                return Fail("cannot read '" + name + "'");
            std::printf("%d\n", value);
        } else {
            std::vector<char16_t> text(vqm::kMaxSettingLength + 1);
            if (!vqm::GetSettingString(store, wideName.c_str(), text.data(), text.size()))
                return Fail("cannot read '" + name + "'");
            std::printf("%s\n", vqm::Utf16ToUtf8(text.data()).c_str());
        }
        return 0;
    }

    // set
    const std::string& value = words[2];
    const vqm::SettingInfo* known = vqm::FindSettingInfo(wideName);
    bool isInt;
    if (!typeFlag.empty()) {
        isInt = typeFlag == "--int";
    } else if (stored != vqm::SettingsStore::Type::Missing) {
        isInt = stored == vqm::SettingsStore::Type::Int;
    } else if (known) {
        isInt = known->isInt;
    } else {
        return Fail("'" + name + "' is new: say --int or --str");
    }
    if (stored != vqm::SettingsStore::Type::Missing &&
        isInt != (stored == vqm::SettingsStore::Type::Int))
        return Fail("'" + name + "' holds " + TypeName(!isInt) + "s, not " + TypeName(isInt) + "s");
    if (known && known->isInt != isInt)
        return Fail("'" + name + "' is " + (known->isInt ? "an integer" : "a string") + " setting");

    int ok;
    if (isInt) {
        int32_t number = 0;
        if (!ParseInteger(value, &number))
            return Fail("'" + value + "' is not a 32-bit whole number");
        ok = vqm::SetSettingInt(store, wideName.c_str(), &number);
    } else {
        std::u16string text = vqm::Utf8ToUtf16(value);
        if (text.size() > vqm::kMaxSettingLength)
            return Fail("the value is longer than " + std::to_string(vqm::kMaxSettingLength) +
                        " characters");
        ok = vqm::SetSettingString(store, wideName.c_str(), text.c_str());
    }
    if (!ok) return Fail("cannot write '" + name + "' to " + store.Path());
    return 0;
}
