#include "support/settings_store.h"

#include <sqlite3.h>

#include <cstdlib>
#include <filesystem>

#include "support/text.h"

namespace vqm {

namespace {

constexpr int kTypeInt = 0;
constexpr int kTypeString = 1;
// Long enough for another program's whole write, short enough that a wedged writer does not
// freeze the dialer's window for good.
constexpr int kBusyTimeoutMs = 5000;

std::string EnvOr(const char* name, const std::string& fallback) {
    const char* value = std::getenv(name);
    return value && *value ? std::string(value) : fallback;
}

std::string HomeFolder() {
    return EnvOr("HOME", "/tmp");
}

// Runs a statement that returns no rows; true when it completed.
bool Exec(sqlite3* db, const char* sql) {
    return sqlite3_exec(db, sql, nullptr, nullptr, nullptr) == SQLITE_OK;
}

struct Statement {
    sqlite3_stmt* stmt = nullptr;
    Statement(sqlite3* db, const char* sql) {
        if (sqlite3_prepare_v2(db, sql, -1, &stmt, nullptr) != SQLITE_OK) stmt = nullptr;
    }
    ~Statement() { sqlite3_finalize(stmt); }
    Statement(const Statement&) = delete;
    Statement& operator=(const Statement&) = delete;
    explicit operator bool() const { return stmt != nullptr; }
};

bool BindName(sqlite3_stmt* stmt, int index, const char16_t* name) {
    return sqlite3_bind_text16(stmt, index, name, -1, SQLITE_TRANSIENT) == SQLITE_OK;
}

}  // namespace

std::string DefaultSettingsPath() {
    const char* explicitPath = std::getenv("VQM_SETTINGS_DB");
    if (explicitPath && *explicitPath) return explicitPath;
    return EnvOr("XDG_CONFIG_HOME", HomeFolder() + "/.config") + "/VQMFull/settings.db";
}

std::string DefaultInstallPath() {
    return EnvOr("XDG_DATA_HOME", HomeFolder() + "/.local/share") + "/VQMFull/";
}

SettingsStore::SettingsStore(const std::string& path) : path_(path) {
    std::error_code error;
    std::filesystem::path folder = std::filesystem::path(path).parent_path();
    if (!folder.empty()) std::filesystem::create_directories(folder, error);

    sqlite3* db = nullptr;
    int rc = sqlite3_open_v2(path.c_str(), &db,
                             SQLITE_OPEN_READWRITE | SQLITE_OPEN_CREATE | SQLITE_OPEN_FULLMUTEX,
                             nullptr);
    if (rc != SQLITE_OK) {
        openError_ = db ? sqlite3_errmsg(db) : sqlite3_errstr(rc);
        sqlite3_close(db);
        return;
    }
    sqlite3_busy_timeout(db, kBusyTimeoutMs);
    // WAL lets readers go on while another program writes; FULL makes each commit durable
    // before the call returns, so a value reported written survives a crash or power loss.
    Exec(db, "PRAGMA journal_mode=WAL");
    Exec(db, "PRAGMA synchronous=FULL");
    if (!Exec(db,
              "CREATE TABLE IF NOT EXISTS settings ("
              " name TEXT PRIMARY KEY NOT NULL,"
              " type INTEGER NOT NULL,"
              " ivalue INTEGER,"
              " svalue TEXT)")) {
        openError_ = sqlite3_errmsg(db);
        sqlite3_close(db);
        return;
    }
    db_ = db;
}

SettingsStore::~SettingsStore() {
    sqlite3_close(db_);
}

SettingsStore::Type SettingsStore::TypeOf(const char16_t* name) {
    if (!db_ || !name) return Type::Missing;
    std::lock_guard<std::mutex> lock(mutex_);
    Statement st(db_, "SELECT type FROM settings WHERE name = ?1");
    if (!st || !BindName(st.stmt, 1, name) || sqlite3_step(st.stmt) != SQLITE_ROW)
        return Type::Missing;
    return sqlite3_column_int(st.stmt, 0) == kTypeInt ? Type::Int : Type::String;
}

std::vector<SettingsStore::Entry> SettingsStore::List() {
    std::vector<Entry> entries;
    if (!db_) return entries;
    std::lock_guard<std::mutex> lock(mutex_);
    Statement st(db_, "SELECT name, type, ivalue, svalue FROM settings ORDER BY name");
    if (!st) return entries;
    while (sqlite3_step(st.stmt) == SQLITE_ROW) {
        Entry entry;
        auto text16 = [&](int column) {
            const void* text = sqlite3_column_text16(st.stmt, column);
            int bytes = sqlite3_column_bytes16(st.stmt, column);
            return text ? std::u16string(static_cast<const char16_t*>(text), bytes / 2)
                        : std::u16string();
        };
        entry.name = text16(0);
        entry.type = sqlite3_column_int(st.stmt, 1) == kTypeInt ? Type::Int : Type::String;
        entry.intValue = static_cast<int32_t>(sqlite3_column_int64(st.stmt, 2));
        entry.text = text16(3);
        entries.push_back(std::move(entry));
    }
    return entries;
}

int GetSettingString(SettingsStore& store, const char16_t* name, char16_t* out, size_t outSize) {
    if (!store.db_ || !name || !out || outSize == 0) return 0;
    std::lock_guard<std::mutex> lock(store.mutex_);
    Statement st(store.db_, "SELECT svalue FROM settings WHERE name = ?1 AND type = 1");
    if (!st || !BindName(st.stmt, 1, name) || sqlite3_step(st.stmt) != SQLITE_ROW) return 0;
    const char16_t* text = static_cast<const char16_t*>(sqlite3_column_text16(st.stmt, 0));
    size_t units = static_cast<size_t>(sqlite3_column_bytes16(st.stmt, 0)) / 2;
    if (!text) units = 0;
    if (units > outSize - 1) units = outSize - 1;
    for (size_t i = 0; i < units; ++i)
        out[i] = text[i];
    out[units] = u'\0';
    return 1;
}

int GetSettingInt(SettingsStore& store, const char16_t* name, int32_t* value) {
    if (!store.db_ || !name || !value) return 0;
    std::lock_guard<std::mutex> lock(store.mutex_);
    Statement st(store.db_, "SELECT ivalue FROM settings WHERE name = ?1 AND type = 0");
    if (!st || !BindName(st.stmt, 1, name) || sqlite3_step(st.stmt) != SQLITE_ROW) return 0;
    *value = static_cast<int32_t>(sqlite3_column_int64(st.stmt, 0));
    return 1;
}

namespace {

// Creates the value or replaces one of the same type in a single statement, which SQLite
// runs as one transaction; a value of the other type is left alone and the write fails.
int Upsert(sqlite3* db, const char16_t* name, int type, const int32_t* number,
           const char16_t* text) {
    Statement st(db,
                 "INSERT INTO settings (name, type, ivalue, svalue) VALUES (?1, ?2, ?3, ?4) "
                 "ON CONFLICT(name) DO UPDATE SET ivalue = excluded.ivalue, "
                 "svalue = excluded.svalue WHERE settings.type = excluded.type");
    if (!st || !BindName(st.stmt, 1, name)) return 0;
    sqlite3_bind_int(st.stmt, 2, type);
    if (number)
        sqlite3_bind_int64(st.stmt, 3, *number);
    else
        sqlite3_bind_null(st.stmt, 3);
    if (text)
        sqlite3_bind_text16(st.stmt, 4, text, -1, SQLITE_TRANSIENT);
    else
        sqlite3_bind_null(st.stmt, 4);
    if (sqlite3_step(st.stmt) != SQLITE_DONE) return 0;
    return sqlite3_changes(db) == 1 ? 1 : 0;
}

}  // namespace

int SetSettingString(SettingsStore& store, const char16_t* name, const char16_t* text) {
    if (!store.db_ || !name || !*name || !text) return 0;
    if (WideLength(text, kMaxSettingLength + 1) > kMaxSettingLength) return 0;
    std::lock_guard<std::mutex> lock(store.mutex_);
    return Upsert(store.db_, name, kTypeString, nullptr, text);
}

int SetSettingInt(SettingsStore& store, const char16_t* name, const int32_t* value) {
    if (!store.db_ || !name || !*name || !value) return 0;
    std::lock_guard<std::mutex> lock(store.mutex_);
    return Upsert(store.db_, name, kTypeInt, value, nullptr);
}

int GetInstallPath(SettingsStore& store, char16_t* out, size_t outSize) {
    if (!out || outSize == 0) return 0;
    char16_t stored[kMaxSettingLength + 1];
    std::u16string path;
    if (GetSettingString(store, u"InstallPath", stored, sizeof stored / sizeof stored[0]) &&
        stored[0] != u'\0') {
        path = stored;
        if (path.back() != u'/') path.push_back(u'/');
    } else {
        path = Utf8ToUtf16(DefaultInstallPath());
    }
    if (path.size() + 1 > outSize) {
        out[0] = u'\0';
        return 0;
    }
    path.copy(out, path.size());
    out[path.size()] = u'\0';
    return 1;
}

}  // namespace vqm
