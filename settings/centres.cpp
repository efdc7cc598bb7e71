#include "settings/centres.h"

#include <string>

#include "messaging/sms_at.h"
#include "support/settings_store.h"

namespace vqm {

const char16_t* const kValidityChoices[kValidityChoiceCount] = {
    u"1 hour", u"6 hours", u"24 hours", u"72 hours", u"1 week", u"Maximum time"};
// The kinds of message a centre can convert a text into, as networks offer them.
const char16_t* const kSendAsChoices[kSendAsChoiceCount] = {u"Text", u"Fax", u"Paging", u"E-mail"};

namespace {

constexpr int kValidityValues[kValidityChoiceCount] = {0, 5, 23, 71, 167, 255};
constexpr char16_t kUseSimDefault[] = u"SettingsMessagesUseSIMDefault";
constexpr char16_t kCount[] = u"SettingsMessagesCenters";
constexpr char16_t kChosen[] = u"SettingsMessagesChosenCenter";
// Entry texts are shown in columns of up to 64 characters.
constexpr size_t kTextSize = 64;

std::u16string Key(const char* prefix, int index) {
    std::string narrow = prefix + std::to_string(index);
    return std::u16string(narrow.begin(), narrow.end());
}

std::u16string ReadText(SettingsStore& store, const std::u16string& key, const char16_t* fallback) {
    char16_t text[kTextSize] = u"";
    return GetSettingString(store, key.c_str(), text, kTextSize) ? std::u16string(text) : fallback;
}

void WriteEntry(SettingsStore& store, int index, const CentreEntry& entry) {
    SetSettingString(store, Key("SettingsSMSC_Name", index).c_str(), entry.name.c_str());
    SetSettingString(store, Key("SettingsSMSC_Number", index).c_str(), entry.number.c_str());
    SetSettingString(store, Key("SettingsSMSC_Validity", index).c_str(), entry.validity.c_str());
    SetSettingString(store, Key("SettingsSMSC_SendAs", index).c_str(), entry.sendAs.c_str());
}

CentreEntry ReadEntry(SettingsStore& store, int index) {
    CentreEntry entry;
    entry.name = ReadText(store, Key("SettingsSMSC_Name", index), kDefaultCentreName);
    entry.number = ReadText(store, Key("SettingsSMSC_Number", index), kDefaultCentreNumber);
    entry.validity = ReadText(store, Key("SettingsSMSC_Validity", index), kDefaultValidity);
    entry.sendAs = ReadText(store, Key("SettingsSMSC_SendAs", index), kDefaultSendAs);
    return entry;
}

int ReadCount(SettingsStore& store) {
    int32_t count = 0;
    if (!GetSettingInt(store, kCount, &count) || count < 0) return 0;
    return count > kMaxCentres ? kMaxCentres : count;
}

void WriteInt(SettingsStore& store, const char16_t* name, int value) {
    const int32_t stored = value;
    SetSettingInt(store, name, &stored);
}

}  // namespace

int ValidityValue(const std::u16string& text) {
    for (int i = 0; i < kValidityChoiceCount; ++i)
        if (text.find(kValidityChoices[i]) != std::u16string::npos) return kValidityValues[i];
    return 0;
}

CentreList LoadCentres(SettingsStore& store) {
    CentreList list;
    int32_t use = 1;
    if (GetSettingInt(store, kUseSimDefault, &use))
        list.useSimDefault = use != 0;
    else
        list.simDefaultAbsent = true;
    const int count = ReadCount(store);
    for (int i = 0; i < count; ++i)
        list.entries.push_back(ReadEntry(store, i));
    int32_t chosen = -1;
    if (GetSettingInt(store, kChosen, &chosen) && chosen >= 0 && chosen < count)
        list.chosen = chosen;
    return list;
}

void SaveCentre(SettingsStore& store, int index, const CentreEntry& entry) {
    const int count = ReadCount(store);
    if (index < 0 || index > count || index >= kMaxCentres) return;
    WriteEntry(store, index, entry);
    if (index == count) WriteInt(store, kCount, count + 1);
}

int DeleteCentre(SettingsStore& store, int index) {
    const CentreList list = LoadCentres(store);
    const int count = static_cast<int>(list.entries.size());
    if (index < 0 || index >= count) return list.chosen;
    for (int i = index; i + 1 < count; ++i)
        WriteEntry(store, i, list.entries[i + 1]);
    // The last keys stay behind, past the count: nothing reads them, and a New writes all four.
    WriteInt(store, kCount, count - 1);
    int chosen = list.chosen;
    if (chosen == index)
        chosen = -1;
    else if (chosen > index)
        --chosen;
    WriteInt(store, kChosen, chosen);
    return chosen;
}

void SaveChosenCentre(SettingsStore& store, int chosen) {
    WriteInt(store, kChosen, chosen);
}

void SaveUseSimDefault(SettingsStore& store, bool use) {
    WriteInt(store, kUseSimDefault, use ? 1 : 0);
}

int PushCentre(Link& link, const CentreEntry& entry) {
    return SmsSetCentre(link, entry.number.c_str(), ValidityValue(entry.validity));
}

int PushSimDefault(Link& link) {
    return SmsSetCentre(link, u"", kSimDefaultValidity);
}

}  // namespace vqm
