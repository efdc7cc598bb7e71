#include "support/settings_store.h"

#include <gtest/gtest.h>
#include <signal.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cstdio>
#include <cstdlib>
#include <filesystem>
#include <string>

#include "support/settings_table.h"
#include "support/text.h"
#include "tests/common/temp_folder.h"

namespace vqm {
namespace {

namespace fs = std::filesystem;

class SettingsTest : public ::testing::Test {
  protected:
    const testing::TempFolder temp_;
    const std::string folder_ = temp_.Path();
    const std::string path_ = folder_ + "/config/VQMFull/settings.db";
};

TEST_F(SettingsTest, MissingNamesLeaveTheOutputAlone) {
    SettingsStore store(path_);
    ASSERT_TRUE(store.IsOpen()) << store.OpenError();
    EXPECT_TRUE(fs::exists(path_));  // the folder was created on the way
    int32_t value = 1234;
    EXPECT_EQ(GetSettingInt(store, u"VolumeLevel", &value), 0);
    EXPECT_EQ(value, 1234);
    char16_t text[8] = u"keep";
    EXPECT_EQ(GetSettingString(store, u"PnpId", text, 8), 0);
    EXPECT_EQ(std::u16string(text), u"keep");
}

TEST_F(SettingsTest, IntegersKeepTheirSignedValue) {
    SettingsStore store(path_);
    for (int32_t v : {0, 4, -1, -3, INT32_MIN, INT32_MAX}) {
        ASSERT_EQ(SetSettingInt(store, u"VolumeLevel", &v), 1);
        int32_t back = 99;
        ASSERT_EQ(GetSettingInt(store, u"VolumeLevel", &back), 1);
        EXPECT_EQ(back, v);
    }
}

TEST_F(SettingsTest, ANameKeepsOneType) {
    SettingsStore store(path_);
    int32_t one = 1;
    ASSERT_EQ(SetSettingInt(store, u"GeneralRefreshSim", &one), 1);
    EXPECT_EQ(SetSettingString(store, u"GeneralRefreshSim", u"1"), 0);
    char16_t text[8] = u"x";
    EXPECT_EQ(GetSettingString(store, u"GeneralRefreshSim", text, 8), 0);
    EXPECT_EQ(std::u16string(text), u"x");

    ASSERT_EQ(SetSettingString(store, u"PnpId", u"TAVRO"), 1);
    EXPECT_EQ(SetSettingInt(store, u"PnpId", &one), 0);
    int32_t value = 7;
    EXPECT_EQ(GetSettingInt(store, u"PnpId", &value), 0);
    EXPECT_EQ(value, 7);
    EXPECT_EQ(store.TypeOf(u"PnpId"), SettingsStore::Type::String);
    EXPECT_EQ(store.TypeOf(u"GeneralRefreshSim"), SettingsStore::Type::Int);
    // Names are case-sensitive: a differently written name is another setting.
    EXPECT_EQ(store.TypeOf(u"pnpid"), SettingsStore::Type::Missing);
}

TEST_F(SettingsTest, StringsUpToTheLimitAndBoundedReads) {
    SettingsStore store(path_);
    std::u16string path(259, u'p');
    path += u"\u00E9";  // 260 units, with a character outside ASCII
    ASSERT_EQ(SetSettingString(store, u"RingTonePath", path.c_str()), 1);
    char16_t out[261];
    ASSERT_EQ(GetSettingString(store, u"RingTonePath", out, 261), 1);
    EXPECT_EQ(std::u16string(out), path);

    char16_t small[6];
    ASSERT_EQ(GetSettingString(store, u"RingTonePath", small, 6), 1);
    EXPECT_EQ(std::u16string(small), u"ppppp");

    std::u16string tooLong(kMaxSettingLength + 1, u'x');
    EXPECT_EQ(SetSettingString(store, u"ATModemCmd", tooLong.c_str()), 0);
    EXPECT_EQ(store.TypeOf(u"ATModemCmd"), SettingsStore::Type::Missing);
    ASSERT_EQ(SetSettingString(store, u"NewIdx", u""), 1);
    char16_t empty[4] = u"abc";
    EXPECT_EQ(GetSettingString(store, u"NewIdx", empty, 4), 1);
    EXPECT_EQ(empty[0], u'\0');
}

TEST_F(SettingsTest, ValuesSurviveReopening) {
    {
        SettingsStore store(path_);
        int32_t size = 35;
        SetSettingInt(store, u"CallLogSize2", &size);
        SetSettingString(store, u"CallForward13", u"+441234");
    }
    SettingsStore again(path_);
    int32_t size = 0;
    EXPECT_EQ(GetSettingInt(again, u"CallLogSize2", &size), 1);
    EXPECT_EQ(size, 35);
    auto entries = again.List();
    ASSERT_EQ(entries.size(), 2u);
    EXPECT_EQ(entries[0].name, u"CallForward13");
    EXPECT_EQ(entries[0].text, u"+441234");
}

TEST_F(SettingsTest, UnopenableStoreFailsQuietly) {
    fs::create_directories(folder_ + "/blocked");
    SettingsStore store(folder_ + "/blocked");  // a folder, not a file
    EXPECT_FALSE(store.IsOpen());
    int32_t value = 5;
    EXPECT_EQ(SetSettingInt(store, u"VolumeLevel", &value), 0);
    EXPECT_EQ(GetSettingInt(store, u"VolumeLevel", &value), 0);
    EXPECT_EQ(value, 5);
}

TEST_F(SettingsTest, InstallPathGetsItsSlash) {
    SettingsStore store(path_);
    setenv("XDG_DATA_HOME", (folder_ + "/data").c_str(), 1);
    char16_t out[260];
    ASSERT_EQ(GetInstallPath(store, out, 260), 1);
    EXPECT_EQ(Utf16ToUtf8(out), folder_ + "/data/VQMFull/");

    SetSettingString(store, u"InstallPath", u"/opt/vqm");
    ASSERT_EQ(GetInstallPath(store, out, 260), 1);
    EXPECT_EQ(std::u16string(out), u"/opt/vqm/");
    SetSettingString(store, u"InstallPath", u"/opt/vqm/");
    ASSERT_EQ(GetInstallPath(store, out, 260), 1);
    EXPECT_EQ(std::u16string(out), u"/opt/vqm/");
    EXPECT_EQ(GetInstallPath(store, out, 9), 0);  // "/opt/vqm/" and its NUL need 10
}

TEST(SettingsTable, KnowsEveryIndexedName) {
    struct Case {
        const char16_t* name;
        bool isInt;
    };
    for (const Case& c :
         {Case{u"CallLogSize1", true}, Case{u"CallLogSize3", true}, Case{u"CallForward13", false},
          Case{u"SettingsSMSC_Name2", false}, Case{u"SettingsSMSC_Validity1", true},
          Case{u"sm_nlength", true}, Case{u"me_total", true}, Case{u"AlertTonePath", false}}) {
        const SettingInfo* info = FindSettingInfo(c.name);
        ASSERT_NE(info, nullptr) << Utf16ToUtf8(c.name);
        EXPECT_EQ(info->isInt, c.isInt) << Utf16ToUtf8(c.name);
    }
    for (const char16_t* unknown : {u"CallLogSize", u"CallForward1", u"xx_total", u"Volume",
                                    u"VolumeLevel2", u"callLogSize1"})
        EXPECT_EQ(FindSettingInfo(unknown), nullptr) << Utf16ToUtf8(unknown);
}

// Two programs writing the store at the same moment: every value each wrote is there.
TEST_F(SettingsTest, TwoProcessesWritingAtOnceLoseNothing) {
    { SettingsStore create(path_); }
    constexpr int kWrites = 300;
    pid_t children[2];
    for (int c = 0; c < 2; ++c) {
        children[c] = fork();
        ASSERT_GE(children[c], 0);
        if (children[c] == 0) {
            SettingsStore store(path_);
            int failures = 0;
            for (int i = 0; i < kWrites; ++i) {
                std::u16string own = Utf8ToUtf16("p" + std::to_string(c) + "_" + std::to_string(i));
                int32_t value = i;
                failures += !SetSettingInt(store, own.c_str(), &value);
                int32_t shared = c * 100000 + i;
                failures += !SetSettingInt(store, u"Shared", &shared);
            }
            _exit(failures == 0 ? 0 : 1);
        }
    }
    for (pid_t child : children) {
        int status = 0;
        ASSERT_EQ(waitpid(child, &status, 0), child);
        ASSERT_TRUE(WIFEXITED(status));
        EXPECT_EQ(WEXITSTATUS(status), 0);
    }
    SettingsStore store(path_);
    for (int c = 0; c < 2; ++c)
        for (int i = 0; i < kWrites; ++i) {
            std::u16string own = Utf8ToUtf16("p" + std::to_string(c) + "_" + std::to_string(i));
            int32_t value = -1;
            ASSERT_EQ(GetSettingInt(store, own.c_str(), &value), 1) << c << " " << i;
            EXPECT_EQ(value, i);
        }
    int32_t shared = -1;
    ASSERT_EQ(GetSettingInt(store, u"Shared", &shared), 1);
    EXPECT_TRUE(shared == kWrites - 1 || shared == 100000 + kWrites - 1) << shared;
}

// A writer killed at an arbitrary moment leaves every value it had been told was written.
TEST_F(SettingsTest, KilledWriterLosesNothingCommitted) {
    { SettingsStore create(path_); }
    int pipeFds[2];
    ASSERT_EQ(pipe(pipeFds), 0);
    pid_t child = fork();
    ASSERT_GE(child, 0);
    if (child == 0) {
        close(pipeFds[0]);
        SettingsStore store(path_);
        std::u16string big(kMaxSettingLength, u'v');
        for (int32_t i = 0;; ++i) {
            big[0] = static_cast<char16_t>(u'a' + i % 26);
            if (!SetSettingInt(store, u"Counter", &i) ||
                !SetSettingString(store, u"Big", big.c_str()))
                _exit(1);
            if (write(pipeFds[1], &i, sizeof i) != sizeof i) _exit(1);
        }
    }
    close(pipeFds[1]);
    int32_t reported = -1, value;
    while (reported < 40 && read(pipeFds[0], &value, sizeof value) == sizeof value)
        reported = value;
    kill(child, SIGKILL);
    while (read(pipeFds[0], &value, sizeof value) == sizeof value)
        reported = value;
    close(pipeFds[0]);
    int status = 0;
    waitpid(child, &status, 0);
    ASSERT_TRUE(WIFSIGNALED(status));

    SettingsStore store(path_);
    ASSERT_TRUE(store.IsOpen());
    int32_t counter = -1;
    ASSERT_EQ(GetSettingInt(store, u"Counter", &counter), 1);
    EXPECT_GE(counter, reported);
    EXPECT_LE(counter, reported + 1);
    char16_t big[kMaxSettingLength + 1];
    ASSERT_EQ(GetSettingString(store, u"Big", big, kMaxSettingLength + 1), 1);
    EXPECT_EQ(std::u16string(big).size(), kMaxSettingLength);  // never half a value
}

struct ToolResult {
    int status;
    std::string out;
};

ToolResult RunTool(const std::string& db, const std::string& args) {
    std::string command = std::string(VQM_SETTINGS_TOOL) + " --db '" + db + "' " + args + " 2>&1";
    FILE* pipe = popen(command.c_str(), "r");
    ToolResult result{-1, ""};
    if (!pipe) return result;
    char buffer[256];
    while (fgets(buffer, sizeof buffer, pipe))
        result.out += buffer;
    int status = pclose(pipe);
    result.status = WIFEXITED(status) ? WEXITSTATUS(status) : -1;
    return result;
}

TEST_F(SettingsTest, ToolReadsAndWritesTheSameStore) {
    EXPECT_EQ(RunTool(path_, "set VolumeLevel 6 --int").status, 0);
    EXPECT_EQ(RunTool(path_, "set InstallPath '/opt/v q m' --str").status, 0);
    EXPECT_EQ(RunTool(path_, "set DialPadPowerDown 4294967295").status, 0);  // known as int
    ToolResult get = RunTool(path_, "get DialPadPowerDown");
    EXPECT_EQ(get.status, 0);
    EXPECT_EQ(get.out, "-1\n");
    EXPECT_EQ(RunTool(path_, "list").out,
              "DialPadPowerDown\tint\t-1\nInstallPath\tstr\t/opt/v q m\nVolumeLevel\tint\t6\n");

    SettingsStore store(path_);
    int32_t volume = 0;
    ASSERT_EQ(GetSettingInt(store, u"VolumeLevel", &volume), 1);
    EXPECT_EQ(volume, 6);
    int32_t eight = 8;
    SetSettingInt(store, u"VolumeLevel", &eight);
    EXPECT_EQ(RunTool(path_, "get VolumeLevel").out, "8\n");
}

TEST_F(SettingsTest, ToolRefusesWhatWouldBreakTheDialer) {
    RunTool(path_, "set VolumeLevel 6 --int");
    ToolResult missing = RunTool(path_, "get PnpId");
    EXPECT_NE(missing.status, 0);
    EXPECT_NE(missing.out.find("no setting named 'PnpId'"), std::string::npos);
    for (const char* bad :
         {"set VolumeLevel loud --str", "set VolumeLevel loud", "set VolumeLevel 4294967296",
          "set VolumeLevel -2147483649", "set VolumeLevel 12abc", "set InstallPath 5 --int",
          "set Brand-new 1", "frobnicate", "get"}) {
        ToolResult r = RunTool(path_, bad);
        EXPECT_NE(r.status, 0) << bad;
        EXPECT_FALSE(r.out.empty()) << bad;
    }
    EXPECT_EQ(RunTool(path_, "get VolumeLevel").out, "6\n");
}

}  // namespace
}  // namespace vqm
