#include "contacts/phonebook_at.h"

#include <cstdio>
#include <cstring>

#include "link/link.h"
#include "support/field_cursor.h"
#include "support/settings_store.h"
#include "support/text.h"

namespace vqm {

namespace {

constexpr char kStorageNames[kPhonebookStorageCount][3] = {"DC", "EN", "FD", "MC",
                                                           "ME", "ON", "RC", "SM"};
constexpr size_t kCommandSize = 32;
constexpr size_t kWriteCommandSize = 256;

// The SIM answers from its own memory, not the network's: a card silent for this long is not
// going to answer, and must not hold the port for ever.
constexpr int kPhonebookAnswerLimitMs = 10000;

int Exchange(Link& link, const char* command, char* reply, size_t replySize) {
    return static_cast<int>(
        AtCommandWithin(link, command, reply, replySize, kPhonebookAnswerLimitMs));
}

// Write and delete select their storage first; what the select answers does not stop them.
void SelectByCode(Link& link, const char* code) {
    const int storage = PhonebookStorageIndex(code);
    if (storage >= 0) PhonebookSelect(link, storage);
}

}  // namespace

const char* PhonebookStorageName(int storage) {
    if (storage < 0 || storage >= kPhonebookStorageCount) return nullptr;
    return kStorageNames[storage];
}

int PhonebookStorageIndex(const char* code) {
    if (!code) return -1;
    for (int i = 0; i < kPhonebookStorageCount; ++i)
        if (std::strcmp(code, kStorageNames[i]) == 0) return i;
    return -1;
}

int PhonebookParseEntryLine(const char* text, const char* end, PhonebookEntry* entry) {
    if (!text || !end || !entry) return 0;
    FieldCursor c(text, end);
    int32_t value = 0;
    if (!c.NextInt(&value)) return 0;
    entry->index = value;
    // Each text field is read aside and kept only when whole: a line cut short writes only the
    // fields it reached.
    char field[sizeof entry->text + sizeof entry->number] = {};
    int length = 0;
    if (!c.Comma() || !c.SeekQuoted(field, sizeof entry->number, &length)) return 0;
    std::memcpy(entry->number, field, sizeof entry->number);
    entry->numberLength = length;
    if (!c.Comma() || !c.NextInt(&value)) return 0;
    entry->type = value;
    if (!c.Comma() || !c.SeekQuoted(field, sizeof entry->text, &length)) return 0;
    std::memcpy(entry->text, field, sizeof entry->text);
    entry->textLength = length;
    return 1;
}

int PhonebookParseRange(const char* reply, int length, PhonebookEntry* entries, int64_t count) {
    if (!reply || !entries || length <= 0) return 0;
    // Entry lines only: a name that holds "+CPBR:" is no entry of its own.
    FieldCursor c(reply, length);
    int found = 0;
    for (int64_t slot = 0; slot < count && c.NextTag("+CPBR:"); ++slot) {
        PhonebookParseEntryLine(c.Position(), c.End(), &entries[slot]);
        ++found;
    }
    // Once no tag is left none will be found for later slots either: they stay as they were.
    return found;
}

int PhonebookParseUsage(const char* reply, int length, int32_t* used, int32_t* total) {
    if (!reply || length <= 0) return 0;
    FieldCursor c(reply, length);
    char name[8];
    int32_t value = 0;
    if (!c.NextTag("+CPBS:") || !c.SeekQuoted(name, sizeof name, nullptr) || !c.Comma() ||
        !c.NextInt(&value))
        return 0;
    if (used) *used = value;
    if (!c.Comma() || !c.NextInt(&value)) return 0;
    if (total) *total = value;
    return 1;
}

void PhonebookParseGeometry(const char* reply, int length, int32_t* numberLength,
                            int32_t* textLength, int32_t* highestIndex) {
    if (!reply || length <= 0) return;
    // Only a range that starts at 1 gives the highest index; (0-99) leaves it at 0.
    FieldCursor range(reply, length);
    if (range.SeekPast("(1-")) range.NextInt(highestIndex);
    FieldCursor lengths(reply, length);
    if (lengths.SeekPast("),") && lengths.NextInt(numberLength) && lengths.Comma())
        lengths.NextInt(textLength);
}

int PhonebookSelect(Link& link, int storage) {
    const char* name = PhonebookStorageName(storage);
    if (!name) return -1;
    char command[kCommandSize];
    std::snprintf(command, sizeof command, "AT+CPBS=\"%s\"\r", name);
    char reply[kPhonebookReplySize];
    const int length = Exchange(link, command, reply, sizeof reply);
    return length == 0 ? -1 : AtFinalResult(reply, length);
}

int PhonebookGetUsage(Link& link, int32_t* used, int32_t* total) {
    char reply[kPhonebookReplySize];
    const int length = Exchange(link, "AT+CPBS?\r", reply, sizeof reply);
    return length == 0 ? 0 : PhonebookParseUsage(reply, length, used, total);
}

int PhonebookGetGeometry(Link& link, int32_t* numberLength, int32_t* textLength,
                         int32_t* highestIndex) {
    if (numberLength) *numberLength = 0;
    if (textLength) *textLength = 0;
    if (highestIndex) *highestIndex = 0;
    char reply[kPhonebookReplySize];
    const int length = Exchange(link, "AT+CPBR=?\r", reply, sizeof reply);
    if (length == 0) return -1;
    PhonebookParseGeometry(reply, length, numberLength, textLength, highestIndex);
    return AtFinalResult(reply, length);
}

int PhonebookReadEntry(Link& link, int index, PhonebookEntry* entry) {
    if (index < 1 || !entry) return 0;
    char command[kCommandSize];
    std::snprintf(command, sizeof command, "AT+CPBR=%d\r", index);
    char reply[kPhonebookReplySize];
    const int length = Exchange(link, command, reply, sizeof reply);
    if (length == 0) return 0;
    FieldCursor c(reply, length);
    return c.NextTag("+CPBR:") ? PhonebookParseEntryLine(c.Position(), c.End(), entry) : 0;
}

int PhonebookReadRange(Link& link, int first, int last, PhonebookEntry* entries) {
    if (first < 1 || last < first || !entries) return 0;
    char command[kCommandSize];
    std::snprintf(command, sizeof command, "AT+CPBR=%d,%d\r", first, last);
    char reply[kPhonebookRangeReplySize];
    const int length = Exchange(link, command, reply, sizeof reply);
    if (length == 0) return 0;
    PhonebookParseRange(reply, length, entries, static_cast<int64_t>(last) - first + 1);
    return 1;
}

int PhonebookWriteEntry(Link& link, const char* storage, const PhonebookEntry& entry) {
    SelectByCode(link, storage);
    char command[kWriteCommandSize];
    // The fields are bounded by their arrays: a record read raw from a file may lack its NUL.
    std::snprintf(command, sizeof command, "AT+CPBW=%d,\"%.*s\",%d,\"%.*s\"\r", entry.index,
                  static_cast<int>(strnlen(entry.number, sizeof entry.number)), entry.number,
                  entry.type, static_cast<int>(strnlen(entry.text, sizeof entry.text)), entry.text);
    char reply[kPhonebookReplySize];
    const int length = Exchange(link, command, reply, sizeof reply);
    return length == 0 ? -1 : AtFinalResult(reply, length);
}

int PhonebookDeleteEntry(Link& link, const char* storage, int index) {
    SelectByCode(link, storage);
    char command[kCommandSize];
    std::snprintf(command, sizeof command, "AT+CPBW=%d\r", index);
    char reply[kPhonebookReplySize];
    const int length = Exchange(link, command, reply, sizeof reply);
    // A literal "OK" anywhere counts, unlike the write, which reads the final result.
    return length > 0 && FindPattern(0, "OK", 2, reply, length) >= 0 ? 1 : 0;
}

namespace {

// "<prefix>_<suffix>" as a UTF-16 setting name; false when the prefix is not a short code.
bool GeometryName(const char* prefix, const char* suffix, char16_t* name, size_t nameSize) {
    if (!prefix || std::strlen(prefix) + std::strlen(suffix) + 2 > nameSize) return false;
    size_t n = 0;
    for (const char* p = prefix; *p; ++p)
        name[n++] = LatinToWide(*p);
    name[n++] = u'_';
    for (const char* p = suffix; *p; ++p)
        name[n++] = LatinToWide(*p);
    name[n] = u'\0';
    return true;
}

}  // namespace

int PhonebookSaveGeometry(SettingsStore& store, const char* prefix, int32_t numberLength,
                          int32_t textLength, int32_t total) {
    const char* suffixes[3] = {"nlength", "tlength", "total"};
    const int32_t values[3] = {numberLength, textLength, total};
    int written = 0;
    for (int i = 0; i < 3; ++i) {
        char16_t name[32];
        if (GeometryName(prefix, suffixes[i], name, 32))
            written += SetSettingInt(store, name, &values[i]);
    }
    return written == 3 ? 1 : 0;
}

int PhonebookLoadGeometry(SettingsStore& store, const char* prefix, int32_t* numberLength,
                          int32_t* textLength, int32_t* total) {
    const char* suffixes[3] = {"nlength", "tlength", "total"};
    int32_t* outputs[3] = {numberLength, textLength, total};
    int found = 0;
    for (int i = 0; i < 3; ++i) {
        char16_t name[32];
        int32_t value = 0;
        if (GeometryName(prefix, suffixes[i], name, 32) && GetSettingInt(store, name, &value)) {
            if (outputs[i]) *outputs[i] = value;
            ++found;
        }
    }
    return found == 3 ? 1 : 0;
}

}  // namespace vqm
