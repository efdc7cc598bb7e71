// What the message store targets share: a settings store in memory whose "InstallPath" is a
// scratch folder (memory-backed where /dev/shm exists, so the store's flushes cost nothing), the
// store on it, and the helpers that lay a fuzz input down as one of the store's files and walk
// what a list shows of the records read back. Every store call reads "InstallPath" from the
// settings store, which costs far more than the parsing, so the targets keep to a few calls.
#pragma once

#include <unistd.h>

#include <cstdint>
#include <cstdio>
#include <cstring>
#include <initializer_list>
#include <string>
#include <vector>

#include "messaging/message_store.h"
#include "messaging/sms_folder.h"
#include "support/numbers.h"
#include "support/settings_store.h"
#include "support/text.h"
#include "tests/common/temp_folder.h"

namespace vqm::fuzz {

class StoreFixture {
  public:
    StoreFixture() : folder_(access("/dev/shm", W_OK) == 0 ? "/dev/shm" : "/tmp") {
        if (folder_.Path().empty()) __builtin_trap();
        SetSettingString(settings, u"InstallPath", Utf8ToUtf16(folder_.Path() + "/").c_str());
        StoreGuardCreate(store);
    }

    // The scratch folder's own path for a store file, without asking the settings store.
    std::string Path(const char* name) const { return folder_.Path() + "/" + name; }

    // The files a target's previous input left, gone, so each input starts alike.
    void Remove(std::initializer_list<const char*> names) const {
        for (const char* name : names)
            std::remove(Path(name).c_str());
    }

    static void Write(const std::string& path, const uint8_t* data, size_t size) {
        FILE* file = std::fopen(path.c_str(), "wb");
        if (!file) __builtin_trap();
        if (size > 0 && std::fwrite(data, 1, size, file) != size) __builtin_trap();
        std::fclose(file);
    }

    SettingsStore settings{":memory:"};
    MessageStore store{settings};

  private:
    testing::TempFolder folder_;
};

// A record as the store hands it out: every text terminated inside its own width.
inline void CheckRecord(const SmsRecord& record) {
    if (!std::memchr(record.number, 0, sizeof record.number) ||
        !std::memchr(record.status, 0, sizeof record.status) ||
        !std::memchr(record.date, 0, sizeof record.date))
        __builtin_trap();
}

// What the SMS Folder's list and message pane make of each record: sender, date and body as
// text, the part mark of a concatenated message, and the date order of the sort.
inline void ShowRecords(const std::vector<SmsRecord>& records) {
    const SmsRecord* previous = nullptr;
    for (const SmsRecord& record : records) {
        CheckRecord(record);
        char16_t wide[64];
        NarrowToWide(record.number, wide, static_cast<int>(std::strlen(record.number)), 64);
        NarrowToWide(record.date, wide, static_cast<int>(std::strlen(record.date)), 64);
        const std::u16string body = MessageBodyText(record);
        if (body.size() > sizeof record.text || MessagePreviewText(record).size() != body.size())
            __builtin_trap();
        Utf16ToUtf8(body);
        SmsPartInfo part{};
        if (SmsPartOf(record, &part) && (part.total < 2 || part.sequence < 1)) __builtin_trap();
        if (previous)
            CompareDateTime(1, previous->date, static_cast<int>(std::strlen(previous->date)),
                            record.date, static_cast<int>(std::strlen(record.date)));
        previous = &record;
    }
}

}  // namespace vqm::fuzz
