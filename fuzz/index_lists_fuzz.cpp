// Feeds arbitrary text to the "NewIdx" and "UnreadIdx" settings (split at the first NUL byte,
// each read as UTF-8, as vqm-settings or another program may have written them) and works the
// lists as the dialer does: the DialPad's count of unread messages and a location taken out of
// "NewIdx" as the listing does, and a new location added to "UnreadIdx". The settings store is
// in memory; each list operation reads (and writes) it, which costs far more than the walk, so
// the target keeps to a few.
#include <algorithm>
#include <cstdint>
#include <string>
#include <vector>

#include "messaging/message_store.h"
#include "support/settings_store.h"
#include "support/text.h"

namespace {

void SetList(vqm::SettingsStore& settings, const char16_t* name, const std::string& utf8) {
    std::u16string text = vqm::Utf8ToUtf16(utf8);
    if (text.size() > vqm::kMaxSettingLength) text.resize(vqm::kMaxSettingLength);
    // A NUL from a surrogate cut in half would end the text early; that is fine.
    vqm::SetSettingString(settings, name, text.c_str());
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
    static vqm::SettingsStore settings(":memory:");
    const std::string input(reinterpret_cast<const char*>(data), size);
    const size_t split = std::min(input.find('\0'), input.size());
    SetList(settings, vqm::kNewIdx, input.substr(0, split));
    SetList(settings, vqm::kUnreadIdx, split < input.size() ? input.substr(split + 1) : "");

    // The DialPad's count: positive locations of either list, each once.
    const std::vector<int> fresh = vqm::IndexListEntries(settings, vqm::kNewIdx);
    const int announced = vqm::UnreadMessageCount(settings);
    if (announced < 0 || announced > static_cast<int>(fresh.size()) + 1024 / 3) __builtin_trap();

    // The listing takes a location out of "NewIdx": one field goes, the others stay as read.
    const auto first = std::find_if(fresh.begin(), fresh.end(), [](int l) { return l >= 1; });
    if (first != fresh.end()) {
        if (vqm::IndexListRemove(settings, vqm::kNewIdx, *first) != 1) __builtin_trap();
        std::vector<int> expected = fresh;
        expected.erase(expected.begin() + (first - fresh.begin()));
        if (vqm::IndexListEntries(settings, vqm::kNewIdx) != expected) __builtin_trap();
    }

    // A new message's location joins "UnreadIdx" and is found there, whatever the list held
    // (unless the list has no room left, which the store refuses).
    const std::vector<int> unread = vqm::IndexListEntries(settings, vqm::kUnreadIdx);
    const int highest = unread.empty() ? 0 : *std::max_element(unread.begin(), unread.end());
    if (highest < 1000000) {
        const int location = std::max(highest, 0) + 1;
        if (vqm::IndexListAdd(settings, vqm::kUnreadIdx, location) == 1 &&
            vqm::IndexListContains(settings, vqm::kUnreadIdx, location) != 1)
            __builtin_trap();
    }
    return 0;
}
