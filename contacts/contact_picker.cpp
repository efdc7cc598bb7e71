#include "contacts/contact_picker.h"

#include <algorithm>
#include <cstring>
#include <filesystem>

#include "contacts/manage_contacts.h"
#include "support/numbers.h"
#include "support/text.h"

namespace vqm {

namespace {

bool IsSimPage(int page) {
    return page == kPickerSimPage || page == kPickerCardPage;
}

// A row with the 8-bit name it is sorted by.
struct Loaded {
    std::string sortName;
    PickerRow row;
};

std::u16string Wide(const char* text, int length, int field) {
    char16_t wide[kOutlookNameSize + 1] = {};
    const int count = std::clamp(length, 0, field);
    NarrowToWide(text, wide, static_cast<int>(strnlen(text, static_cast<size_t>(count))),
                 kOutlookNameSize + 1);
    return wide;
}

}  // namespace

bool LoadPickerRows(PhonebookCaches& caches, int page, std::vector<PickerRow>* rows) {
    rows->clear();
    if (page < 0 || page >= kPickerPageCount) return false;
    const bool sim = IsSimPage(page);
    CacheGroup& group = sim ? caches.sim : caches.outlook;
    const int file = sim ? page + 1 : page - kPickerMobilePage + 1;
    const size_t size = CacheRecordSize(group, file);
    std::vector<Loaded> loaded;
    FILE* stream = CacheOpen(group, file, kCacheRead);
    const bool granted = stream || group.lock.state.load() != kCacheWriting;
    if (stream) {
        unsigned char record[kOutlookNumbersRecordSize];
        while (std::fread(record, 1, size, stream) == size) {
            Loaded one;
            if (sim) {
                PhonebookEntry entry;
                std::memcpy(&entry, record, sizeof entry);
                const int textLength = std::clamp<int>(entry.textLength, 0, kPhonebookTextSize);
                one.sortName.assign(entry.text,
                                    strnlen(entry.text, static_cast<size_t>(textLength)));
                one.row.name = Wide(entry.text, entry.textLength, kPhonebookTextSize);
                one.row.number = Wide(entry.number, entry.numberLength, kPhonebookNumberSize);
            } else {
                const char* name = reinterpret_cast<const char*>(record);
                const char* number = name + kOutlookNameSize;  // the first number of the record
                const int length = static_cast<int>(strnlen(number, kOutlookNumberSize));
                if (length == 0) continue;
                char16_t wide[kOutlookNameSize + 1];
                NarrowToWideZ(name, kOutlookNameSize, wide, kOutlookNameSize + 1);
                one.sortName.assign(name, strnlen(name, kOutlookNameSize));
                one.row.name = wide;
                one.row.number = Wide(number, length, kOutlookNumberSize);
            }
            loaded.push_back(std::move(one));
        }
    }
    CacheClose(group, stream);
    std::stable_sort(loaded.begin(), loaded.end(), [](const Loaded& a, const Loaded& b) {
        return CompareText(0, a.sortName.data(), static_cast<int>(a.sortName.size()),
                           b.sortName.data(), static_cast<int>(b.sortName.size())) < 0;
    });
    for (Loaded& one : loaded)
        rows->push_back(std::move(one.row));
    return granted;
}

std::u16string PickedRecipients(const PickerRows& rows, const PickerTicks& ticked) {
    std::u16string text;
    for (int page = 0; page < kPickerPageCount; ++page)
        for (size_t i = 0; i < rows[page].size() && i < ticked[page].size(); ++i)
            if (ticked[page][i]) text += RecipientText(rows[page][i].name, rows[page][i].number);
    return text;
}

std::string PickerCacheSignature(PhonebookCaches& caches) {
    std::string signature;
    for (CacheGroup* group : {&caches.sim, &caches.outlook}) {
        for (int file = 1; file <= CacheFileCount(*group); ++file) {
            std::error_code error;
            const std::filesystem::path path = CachePath(*group, file);
            const auto size = std::filesystem::file_size(path, error);
            if (error) {
                signature += "-;";
                continue;
            }
            const auto time = std::filesystem::last_write_time(path, error);
            signature += std::to_string(size) + "@" +
                         std::to_string(error ? 0 : time.time_since_epoch().count()) + ";";
        }
    }
    return signature;
}

unsigned PickerActivated(PickerLoadState& state, int cardState, const std::string& signature) {
    if (!state.activated) {
        // The address-book copy is cleared on the first activation; its 1124 goes on to the SIM.
        state.activated = true;
        return kPickerOutlookClear;
    }
    if (!state.simRequested) {
        if (cardState != 2) return kPickerClearTicks;
        state.simRequested = true;
        return kPickerSimLoad | kPickerClearTicks;
    }
    if (!state.loaded) return kPickerNoWork;  // the load reports back soon
    if (signature != state.signature) {
        state.signature = signature;
        return kPickerReloadOutlook | kPickerReloadSim;
    }
    return kPickerClearTicks;
}

unsigned PickerOutlookDone(PickerLoadState& state, int cardState) {
    unsigned work = kPickerReloadOutlook;
    if (state.activated && !state.simRequested && cardState == 2) {
        state.simRequested = true;
        work |= kPickerSimLoad;
    }
    return work;
}

unsigned PickerSimDone(PickerLoadState& state, const std::string& signature) {
    state.loaded = true;
    state.signature = signature;
    return kPickerReloadSim;
}

}  // namespace vqm
