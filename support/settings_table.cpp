#include "support/settings_table.h"

#include <cstddef>
#include <cstring>

namespace vqm {

namespace {

// Indexed names: '#' stands for one decimal number, "%s" for "sm" or "me".
const SettingInfo kSettings[] = {
    {u"InstallPath", false, u"~/.local/share/VQMFull/"},
    {u"PnpId", false, u""},
    {u"DialPadPowerDown", true, u"0"},
    {u"VolumeLevel", true, u"4"},
    {u"CeNFMessageAlert", true, u"0"},
    {u"CallLogSize#", true, u"20"},
    {u"NewIdx", false, u""},
    {u"UnreadIdx", false, u""},
    {u"SettingsMessagesUseSIMDefault", true, u""},
    {u"SettingsMessagesCenters", true, u""},
    {u"SettingsMessagesChosenCenter", true, u""},
    {u"SettingsSMSC_Name#", false, u""},
    {u"SettingsSMSC_Number#", false, u""},
    {u"SettingsSMSC_SendAs#", true, u""},
    {u"SettingsSMSC_Validity#", true, u""},
    {u"%s_nlength", true, u""},
    {u"%s_tlength", true, u""},
    {u"%s_total", true, u""},
    {u"GeneralRefreshSim", true, u"0"},
    {u"GeneralRefreshOutlook", true, u"0"},
    {u"CallForward##", false, u"Unknown"},
    {u"SettingsModemMethod", true, u"0"},
    {u"SettingsModemSpeed", true, u"0"},
    {u"ATModemCmd", false, u""},
    {u"RingToneLevel", true, u"3"},
    {u"AlertToneLevel", true, u"3"},
    {u"RingToneRaise", true, u"0"},
    {u"AlertToneRaise", true, u"0"},
    {u"RingToneSystemTone", true, u"0"},
    {u"AlertToneSystemTone", true, u"0"},
    {u"RingTonePath", false, u"<install folder>Ring1.wav"},
    {u"AlertTonePath", false, u"Alarm1.wav"},
};

bool IsDigit(char16_t c) {
    return c >= u'0' && c <= u'9';
}

// Matches name against a pattern whose '#' takes one or more digits ("CallForward##" takes
// exactly two numbers, each written as digits, so "CallForward13" is service class 1,
// reason 3) and whose "%s" takes "sm" or "me".
bool Matches(const char16_t* pattern, const std::u16string& name) {
    size_t n = 0;
    for (const char16_t* p = pattern; *p; ++p) {
        if (p[0] == u'%' && p[1] == u's') {
            if (name.compare(n, 2, u"sm") != 0 && name.compare(n, 2, u"me") != 0) return false;
            n += 2;
            ++p;
        } else if (*p == u'#') {
            if (n >= name.size() || !IsDigit(name[n])) return false;
            ++n;
            // The last '#' of a pattern takes every remaining digit.
            if (p[1] != u'#')
                while (n < name.size() && IsDigit(name[n]))
                    ++n;
        } else {
            if (n >= name.size() || name[n] != *p) return false;
            ++n;
        }
    }
    return n == name.size();
}

}  // namespace

const SettingInfo* FindSettingInfo(const std::u16string& name) {
    for (const SettingInfo& info : kSettings)
        if (Matches(info.pattern, name)) return &info;
    return nullptr;
}

}  // namespace vqm
