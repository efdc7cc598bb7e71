#include "contacts/manage_contacts.h"

#include <algorithm>
#include <cstdio>

#include "contacts/phonebook_at.h"
#include "support/numbers.h"
#include "support/text.h"

namespace vqm {

namespace {

constexpr size_t kFieldChars = 32;

std::u16string Lower(std::u16string text) {
    for (char16_t& ch : text)
        if (ch >= u'A' && ch <= u'Z') ch = static_cast<char16_t>(ch - u'A' + u'a');
    return text;
}

std::u16string Ascii(const char* text) {
    return std::u16string(text, text + std::char_traits<char>::length(text));
}

}  // namespace

std::u16string NonEnglishMessage(const std::u16string& name) {
    std::u16string message = u"Contact name cannot have non-English characters.";
    for (char16_t ch : name) {
        if (ch >= 0x20 && ch <= 0x7E) continue;
        char code[16];
        std::snprintf(code, sizeof code, "U+%04X", static_cast<unsigned>(ch));
        // A control character is named by its code alone: shown, it would be nothing.
        if (ch < 0x20 || ch == 0x7F)
            message += u"\n" + Ascii(code) + u" cannot be stored.";
        else
            message +=
                u"\n\"" + std::u16string(1, ch) + u"\" (" + Ascii(code) + u") cannot be stored.";
        break;
    }
    return message;
}

ContactCheckResult CheckContact(const std::u16string& nameTyped, const std::u16string& numberTyped,
                                int32_t textLimit, int32_t numberLimit) {
    const std::u16string name = nameTyped.substr(0, kFieldChars);
    const std::u16string number = numberTyped.substr(0, kFieldChars);
    ContactCheckResult result;
    if (name.empty()) return result;
    // The card's own form of the name is what has to be plain: 8-bit, its bytes counted.
    char narrow[kFieldChars + 1];
    const int bytes =
        WideToNarrow(name.c_str(), narrow, static_cast<int>(name.size()), sizeof narrow);
    bool english = IsEnglishText(narrow, static_cast<size_t>(bytes)) != 0;
    // A character with no 8-bit form became '?' above; it is no more English than before.
    english = english && IsEnglishText(name.c_str(), name.size() * 2);
    if (!english) {
        result.check = ContactCheck::Refused;
        result.message = NonEnglishMessage(name);
        return result;
    }
    char text[96];
    if (static_cast<int64_t>(name.size()) > textLimit) {
        std::snprintf(text, sizeof text, "Contact name cannot longer than %d characters.",
                      textLimit);
        result.check = ContactCheck::Refused;
        result.message = Ascii(text);
        return result;
    }
    if (number.empty()) return result;
    if (static_cast<int64_t>(number.size()) > numberLimit) {
        std::snprintf(text, sizeof text, "Contact number cannot more than %d digits.", numberLimit);
        result.check = ContactCheck::Refused;
        result.message = Ascii(text);
        return result;
    }
    result.check = ContactCheck::Ok;
    return result;
}

int NumberType(const std::u16string& number) {
    return !number.empty() && number[0] == u'+' ? 145 : 129;
}

StorageLimits ReadStorageLimits(SettingsStore& settings, const std::string& storageCode) {
    StorageLimits limits;
    PhonebookLoadGeometry(settings, storageCode == "SM" ? "sm" : "me", &limits.numberLength,
                          &limits.textLength, &limits.total);
    return limits;
}

bool FindMatches(const std::u16string& nameRow, const std::u16string& searchText) {
    const std::u16string name = Lower(nameRow.substr(0, 128));
    const std::u16string search = Lower(searchText);
    if (name.empty()) return false;
    if (name.size() > search.size()) return name.find(search) != std::u16string::npos;
    return search.find(name) != std::u16string::npos;
}

int FindNext(const std::vector<std::u16string>& names, const std::u16string& search, int lastHit) {
    const int count = static_cast<int>(names.size());
    const int start = lastHit >= 0 && lastHit < count ? lastHit + 1 : 0;
    for (int i = start; i < count; ++i)
        if (FindMatches(names[i], search)) return i;
    // Once round to the top, up to where this search began.
    for (int i = 0; i < start && i < count; ++i)
        if (FindMatches(names[i], search)) return i;
    return -1;
}

std::u16string RecipientText(const std::u16string& name, const std::u16string& number) {
    return name.substr(0, 64) + u"<" + number.substr(0, 32) + u">;\r\n";
}

unsigned ContactsCardStateChanged(ContactsLoadState& state, int cardState, bool viewCurrent,
                                  int32_t refreshSim, int32_t refreshOutlook) {
    if (cardState == 1) {
        state = ContactsLoadState{};
        return kWorkEmptySimLists;
    }
    if (cardState != 2) return kWorkNone;
    if (viewCurrent) return ContactsActivated(state, cardState);
    unsigned work = kWorkNone;
    if (refreshOutlook == 1) {
        state.outlook = 1;
        work |= kWorkOutlookRebuild;
    }
    if (refreshSim == 1) {
        state.sim = 1;
        state.startupRebuild = true;
        work |= kWorkSimRebuild;
    }
    return work;
}

unsigned ContactsActivated(ContactsLoadState& state, int cardState) {
    if (cardState == 1) return kWorkNone;
    if (state.outlook == 0) {
        state.outlook = 1;
        return kWorkOutlookClear;
    }
    if (!state.pending && state.sim == 0 && cardState == 2) {
        state.sim = 1;
        state.startupRebuild = false;
        return kWorkSimLoad;
    }
    return kWorkNone;
}

unsigned ContactsOutlookDone(ContactsLoadState& state, int cardState) {
    unsigned work = kWorkForwardOutlook;
    state.outlook = 2;
    if (state.pending || state.sim != 0) {
        state.pending = true;
    } else if (cardState == 2) {
        state.sim = 1;
        state.startupRebuild = false;
        work |= kWorkSimLoad;
    } else {
        state.pending = true;
    }
    return work;
}

unsigned ContactsSimDone(ContactsLoadState& state) {
    state.sim = 2;
    if (!state.startupRebuild) state.pending = true;
    return kWorkForwardSim | kWorkLearnGeometry;
}

}  // namespace vqm
