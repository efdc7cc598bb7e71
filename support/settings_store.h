// The named-value settings store shared by the dialer, its companion, the installer
// and the vqm-settings tool: one SQLite file, so that a value written by one program
// is seen by the others, and a program killed in the middle of a write leaves either
// the old value or the new one, never half of one.
#pragma once

#include <cstddef>
#include <cstdint>
#include <mutex>
#include <string>
#include <vector>

struct sqlite3;

namespace vqm {

// $VQM_SETTINGS_DB, else $XDG_CONFIG_HOME/VQMFull/settings.db (~/.config/VQMFull/...).
std::string DefaultSettingsPath();

class SettingsStore {
  public:
    // Opens (creating the file and its folder when needed) the store at path.
    explicit SettingsStore(const std::string& path = DefaultSettingsPath());
    ~SettingsStore();
    SettingsStore(const SettingsStore&) = delete;
    SettingsStore& operator=(const SettingsStore&) = delete;

    bool IsOpen() const { return db_ != nullptr; }
    const std::string& Path() const { return path_; }
    // Why the store could not be opened, for the tool's messages.
    const std::string& OpenError() const { return openError_; }

    enum class Type { Missing, Int, String };
    struct Entry {
        std::u16string name;
        Type type;
        int32_t intValue;
        std::u16string text;
    };

    Type TypeOf(const char16_t* name);
    std::vector<Entry> List();

  private:
    friend int GetSettingString(SettingsStore&, const char16_t*, char16_t*, size_t);
    friend int GetSettingInt(SettingsStore&, const char16_t*, int32_t*);
    friend int SetSettingString(SettingsStore&, const char16_t*, const char16_t*);
    friend int SetSettingInt(SettingsStore&, const char16_t*, const int32_t*);

    std::string path_;
    std::string openError_;
    sqlite3* db_ = nullptr;
    std::mutex mutex_;  // one statement at a time on the shared connection
};

// The longest string value the store takes, in UTF-16 units (paths need 260).
inline constexpr size_t kMaxSettingLength = 1024;

// The four operations. A name is used with one type only: reading or writing it as
// the other type fails. Reads return 0 for a missing name and leave the output alone.
// GetSettingString copies at most outSize - 1 units and a NUL.
// Integers are kept as 32 bits and read back as the signed values callers use.
int GetSettingString(SettingsStore& store, const char16_t* name, char16_t* out, size_t outSize);
int GetSettingInt(SettingsStore& store, const char16_t* name, int32_t* value);
int SetSettingString(SettingsStore& store, const char16_t* name, const char16_t* text);
int SetSettingInt(SettingsStore& store, const char16_t* name, const int32_t* value);

// The folder of the program's files: "InstallPath", with a '/' appended when it lacks
// one; when unset, $XDG_DATA_HOME/VQMFull/ (~/.local/share/VQMFull/). Returns 1, or 0
// when out (at least 260 units) cannot hold it.
int GetInstallPath(SettingsStore& store, char16_t* out, size_t outSize);
std::string DefaultInstallPath();

}  // namespace vqm
