// Every setting name the dialer uses, with its type and its default, so that tools can refuse
// a value of the wrong type before the dialer ever reads it.
#pragma once

#include <string>

namespace vqm {

struct SettingInfo {
    const char16_t* pattern;  // the name, or a printf pattern for the indexed names
    bool isInt;
    const char16_t* defaultText;  // as shown to a user; empty when the reader has none
};

// The entry for a name, resolving the indexed names ("CallLogSize2", "CallForward13",
// "sm_total", ...); nullptr for a name the dialer never uses.
const SettingInfo* FindSettingInfo(const std::u16string& name);

}  // namespace vqm
