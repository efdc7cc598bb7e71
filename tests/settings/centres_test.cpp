// The message-centre list in the settings: validity texts to the values sent, what missing,
// mistyped and out-of-range values read as, and the keys after edits and deletes.
#include "settings/centres.h"

#include <gtest/gtest.h>

#include <string>
#include <vector>

#include "support/settings_store.h"
#include "tests/common/temp_folder.h"

namespace vqm {
namespace {

TEST(CentreValidity, FirstContainedTextGivesTheValue) {
    const struct {
        const char16_t* text;
        int value;
    } cases[] = {
        {u"1 hour", 0},
        {u"6 hours", 5},
        {u"24 hours", 23},
        {u"72 hours", 71},
        {u"1 week", 167},
        {u"Maximum time", 255},
        {u"about 24 hours", 23},
        {u"", 0},
        {u"2 weeks", 0},
        {u"maximum time", 0},  // containment is exact, case included
        // "6 hours" is looked for before "72 hours": the first hit in table order wins.
        {u"6 hours or 72 hours", 5},
    };
    for (const auto& c : cases)
        EXPECT_EQ(ValidityValue(c.text), c.value) << c.value;
}

class CentresTest : public ::testing::Test {
  protected:
    void SetInt(const char16_t* name, int32_t value) { SetSettingInt(store_, name, &value); }
    std::vector<std::u16string> Names() {
        std::vector<std::u16string> names;
        for (const CentreEntry& entry : LoadCentres(store_).entries)
            names.push_back(entry.name);
        return names;
    }
    static CentreEntry Entry(const char16_t* name, const char16_t* number) {
        CentreEntry entry;
        entry.name = name;
        entry.number = number;
        return entry;
    }

    testing::TempFolder temp_;
    SettingsStore store_{temp_ / "settings.db"};
};

TEST_F(CentresTest, MissingWrongTypeAndOutOfRangeReadAsDefaults) {
    CentreList fresh = LoadCentres(store_);
    EXPECT_TRUE(fresh.useSimDefault);
    EXPECT_TRUE(fresh.simDefaultAbsent);
    EXPECT_EQ(fresh.chosen, -1);
    EXPECT_TRUE(fresh.entries.empty());
    // Reading wrote nothing back.
    EXPECT_EQ(store_.TypeOf(u"SettingsMessagesUseSIMDefault"), SettingsStore::Type::Missing);

    SetInt(u"SettingsMessagesCenters", 2);
    SetSettingString(store_, u"SettingsSMSC_Name0", u"Home");
    const struct {
        int32_t chosen;
        int expected;
    } chosen[] = {{0, 0}, {1, 1}, {2, -1}, {-1, -1}, {-5, -1}, {1 << 30, -1}};
    for (const auto& c : chosen) {
        SetInt(u"SettingsMessagesChosenCenter", c.chosen);
        EXPECT_EQ(LoadCentres(store_).chosen, c.expected) << c.chosen;
    }
    const CentreList list = LoadCentres(store_);
    ASSERT_EQ(list.entries.size(), 2u);
    EXPECT_EQ(list.entries[0].name, u"Home");
    EXPECT_EQ(list.entries[0].number, u"12345678");
    EXPECT_EQ(list.entries[1], CentreEntry{});
    EXPECT_EQ(list.entries[1].name, u"Nil");
    EXPECT_EQ(list.entries[1].validity, u"1 week");
    EXPECT_EQ(list.entries[1].sendAs, u"Text");

    // A count negative or absurd (one stored as text: OtherTypeReadsAsMissing).
    SetInt(u"SettingsMessagesCenters", -3);
    EXPECT_TRUE(LoadCentres(store_).entries.empty());
    SetInt(u"SettingsMessagesCenters", 2000000000);
    EXPECT_EQ(LoadCentres(store_).entries.size(), static_cast<size_t>(kMaxCentres));
    SetInt(u"SettingsMessagesUseSIMDefault", 0);
    EXPECT_FALSE(LoadCentres(store_).useSimDefault);
    EXPECT_FALSE(LoadCentres(store_).simDefaultAbsent);
}

CentreEntry With(CentreEntry entry, std::u16string CentreEntry::*field, const char16_t* value) {
    entry.*field = value;
    return entry;
}

// A value stored with the other type (by hand, or by another program's mistake) reads as if
// it were missing; the other keys still read normally.
TEST(CentreSettings, OtherTypeReadsAsMissing) {
    struct Expected {
        size_t entries;
        int chosen;
        bool useSimDefault, simDefaultAbsent;
        CentreEntry first;
    };
    CentreEntry home;
    home.name = u"Home";
    home.number = u"+306900000";
    home.validity = u"24 hours";
    home.sendAs = u"Fax";
    const struct {
        const char16_t* key;   // nullptr: every key of its own type
        const char16_t* text;  // stored as text when set, else as the number
        int32_t number;
        Expected expected;
    } cases[] = {
        {nullptr, nullptr, 0, {2, 1, false, false, home}},
        {u"SettingsMessagesCenters", u"2", 0, {0, -1, false, false, {}}},
        {u"SettingsMessagesChosenCenter", u"1", 0, {2, -1, false, false, home}},
        {u"SettingsMessagesUseSIMDefault", u"0", 0, {2, 1, true, true, home}},
        {u"SettingsSMSC_Name0",
         nullptr,
         7,
         {2, 1, false, false, With(home, &CentreEntry::name, u"Nil")}},
        {u"SettingsSMSC_Number0",
         nullptr,
         306900000,
         {2, 1, false, false, With(home, &CentreEntry::number, u"12345678")}},
        {u"SettingsSMSC_Validity0",
         nullptr,
         23,
         {2, 1, false, false, With(home, &CentreEntry::validity, u"1 week")}},
        {u"SettingsSMSC_SendAs0",
         nullptr,
         1,
         {2, 1, false, false, With(home, &CentreEntry::sendAs, u"Text")}},
    };
    for (const auto& c : cases) {
        const std::string label =
            c.key ? std::string(c.key, c.key + std::char_traits<char16_t>::length(c.key)) : "none";
        testing::TempFolder temp;
        SettingsStore store(temp / "settings.db");
        // The case's key is left out of the usual values and written with the other type.
        const auto heldBack = [&](const char16_t* key) {
            return c.key && std::u16string(key) == c.key;
        };
        const auto setInt = [&](const char16_t* key, int32_t value) {
            if (!heldBack(key)) SetSettingInt(store, key, &value);
        };
        const auto setText = [&](const char16_t* key, const std::u16string& value) {
            if (!heldBack(key)) SetSettingString(store, key, value.c_str());
        };
        setInt(u"SettingsMessagesCenters", 2);
        setInt(u"SettingsMessagesChosenCenter", 1);
        setInt(u"SettingsMessagesUseSIMDefault", 0);
        setText(u"SettingsSMSC_Name0", home.name);
        setText(u"SettingsSMSC_Number0", home.number);
        setText(u"SettingsSMSC_Validity0", home.validity);
        setText(u"SettingsSMSC_SendAs0", home.sendAs);
        if (c.key && c.text) {
            ASSERT_EQ(SetSettingString(store, c.key, c.text), 1) << label;
        } else if (c.key) {
            ASSERT_EQ(SetSettingInt(store, c.key, &c.number), 1) << label;
        }

        const CentreList list = LoadCentres(store);
        EXPECT_EQ(list.entries.size(), c.expected.entries) << label;
        EXPECT_EQ(list.chosen, c.expected.chosen) << label;
        EXPECT_EQ(list.useSimDefault, c.expected.useSimDefault) << label;
        EXPECT_EQ(list.simDefaultAbsent, c.expected.simDefaultAbsent) << label;
        if (!list.entries.empty()) {
            EXPECT_EQ(list.entries[0], c.expected.first) << label;
            EXPECT_EQ(list.entries[1], CentreEntry{}) << label;
        }
    }
}

TEST_F(CentresTest, DeleteMovesLaterEntriesDownAndTheChoiceFollows) {
    for (const char16_t* name : {u"A", u"B", u"C", u"D"})
        SaveCentre(store_, static_cast<int>(Names().size()), Entry(name, u"0100"));
    ASSERT_EQ(Names(), (std::vector<std::u16string>{u"A", u"B", u"C", u"D"}));
    CentreEntry edited = Entry(u"C2", u"+3069");
    edited.validity = u"Maximum time";
    edited.sendAs = u"Fax";
    SaveCentre(store_, 2, edited);
    SaveCentre(store_, 9, Entry(u"gap", u"1"));  // past the end: refused, no gap
    ASSERT_EQ(Names(), (std::vector<std::u16string>{u"A", u"B", u"C2", u"D"}));

    const struct {
        int chosenBefore, deleted, chosenAfter;
        std::vector<std::u16string> names;
    } steps[] = {
        {3, 1, 2, {u"A", u"C2", u"D"}},  // chosen after the deleted one moves down with it
        {0, 2, 0, {u"A", u"C2"}},        // chosen before it stays
        {1, 1, -1, {u"A"}},              // the chosen one itself: none chosen
        {0, 5, 0, {u"A"}},               // out of range: nothing changes
        {0, 0, -1, {}},
    };
    for (const auto& step : steps) {
        SaveChosenCentre(store_, step.chosenBefore);
        EXPECT_EQ(DeleteCentre(store_, step.deleted), step.chosenAfter) << step.deleted;
        EXPECT_EQ(LoadCentres(store_).chosen, step.chosenAfter);
        EXPECT_EQ(Names(), step.names);
        if (step.names.size() == 2) {
            // Every field moved with its entry.
            const CentreEntry moved = LoadCentres(store_).entries[1];
            EXPECT_EQ(moved, edited);
        }
    }
    EXPECT_EQ(store_.TypeOf(u"SettingsMessagesCenters"), SettingsStore::Type::Int);
}

}  // namespace
}  // namespace vqm
