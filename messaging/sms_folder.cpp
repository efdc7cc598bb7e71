#include "messaging/sms_folder.h"

#include <algorithm>
#include <cstring>
#include <map>
#include <tuple>

#include "link/link.h"
#include "support/gsm.h"
#include "support/numbers.h"
#include "support/settings_store.h"
#include "support/text.h"

namespace vqm {

namespace {

constexpr const char16_t* kPageTitles[kPageCount] = {u"Inbox", u"Outbox", u"Sent", u"Draft",
                                                     u"PDA"};

bool StatusIs(const SmsRecord& record, const char* word) {
    return std::strncmp(record.status, word, std::strlen(word)) == 0;
}

// The page of a SIM cache record, -1 for one that is not listed.
int SimPage(const SmsRecord& record) {
    if (StatusIs(record, "REC READ") || StatusIs(record, "ALL") || StatusIs(record, "REC UNREAD"))
        return kPageInbox;
    if (StatusIs(record, "STO UNSENT")) return kPageOutbox;
    if (StatusIs(record, "STO SENT")) return kPageSent;
    return -1;
}

int LocalPage(const SmsRecord& record) {
    if (StatusIs(record, "STO SENT")) return kPageSent;
    if (StatusIs(record, "PDA DRAFT")) return kPageDraft;
    if (StatusIs(record, "PDA PDA")) return kPagePda;
    return -1;
}

std::u16string OneLine(std::u16string text) {
    std::replace(text.begin(), text.end(), u'\r', u' ');
    std::replace(text.begin(), text.end(), u'\n', u' ');
    return text;
}

std::u16string Wide(const char* narrow, size_t size) {
    char16_t wide[64];
    const int count = NarrowToWide(narrow, wide, static_cast<int>(strnlen(narrow, size)), 64);
    return std::u16string(wide, static_cast<size_t>(count));
}

FolderRow MakeRow(int folder, const SmsRecord& record, const NameLookup& names) {
    FolderRow row;
    row.folder = folder;
    row.record = record;
    row.from = names && record.number[0] ? names(record.number) : std::u16string();
    if (row.from.empty()) row.from = Wide(record.number, sizeof record.number);
    row.body = MessageBodyText(record);
    row.preview = OneLine(row.body);
    row.date = Wide(record.date, sizeof record.date);
    row.parts = {record.index};
    return row;
}

// The parts of one concatenated message (same page, sender, reference and count) as one row,
// in part order, with a note where a part has not arrived.
void JoinParts(std::vector<FolderRow>& rows) {
    struct Key {
        std::string number;
        int reference, total;
        bool operator<(const Key& o) const {
            return std::tie(number, reference, total) < std::tie(o.number, o.reference, o.total);
        }
    };
    std::map<Key, std::map<int, FolderRow>> groups;
    std::vector<FolderRow> joined;
    for (FolderRow& row : rows) {
        SmsPartInfo part{};
        if (!SmsPartOf(row.record, &part) || part.sequence > part.total) {
            joined.push_back(std::move(row));
            continue;
        }
        auto& group = groups[{row.record.number, part.reference, part.total}];
        group.emplace(part.sequence, std::move(row));
    }
    for (auto& [key, parts] : groups) {
        FolderRow row = parts.begin()->second;
        row.body.clear();
        row.parts.clear();
        row.unread = false;
        for (int sequence = 1; sequence <= key.total; ++sequence) {
            const auto found = parts.find(sequence);
            if (found == parts.end()) {
                char note[48];
                std::snprintf(note, sizeof note, "(part %d of %d missing)", sequence, key.total);
                row.body += Utf8ToUtf16(note);
                continue;
            }
            row.body += found->second.body;
            row.parts.push_back(found->second.record.index);
            row.unread = row.unread || found->second.unread;
        }
        row.preview = OneLine(row.body);
        joined.push_back(std::move(row));
    }
    rows = std::move(joined);
}

// Newest first; messages without a date (drafts, unsent ones) after them, by index.
void SortNewestFirst(std::vector<FolderRow>& rows) {
    std::stable_sort(rows.begin(), rows.end(), [](const FolderRow& a, const FolderRow& b) {
        const int aLength = static_cast<int>(strnlen(a.record.date, sizeof a.record.date));
        const int bLength = static_cast<int>(strnlen(b.record.date, sizeof b.record.date));
        if ((aLength == 0) != (bLength == 0)) return bLength == 0;
        if (aLength == 0) return a.record.index < b.record.index;
        const int order = CompareDateTime(1, a.record.date, aLength, b.record.date, bLength);
        // Within one second the later arrival is the one at the higher location.
        return order != 0 ? order < 0 : a.record.index > b.record.index;
    });
}

void Box(const FolderUi& ui, const char16_t* text, const char16_t* title) {
    if (ui.box) ui.box(text, title);
}

void Begin(const FolderUi& ui) {
    if (ui.beginBusy) ui.beginBusy();
}

void End(const FolderUi& ui) {
    if (ui.endBusy) ui.endBusy();
}

int FolderOfPage(int page) {
    return page == kPageInbox || page == kPageOutbox ? kFolderSim : kFolderLocal;
}

void SetStatus(SmsRecord& record, const char* status) {
    std::memset(record.status, 0, sizeof record.status);
    std::strncpy(record.status, status, sizeof record.status - 1);
}

}  // namespace

const char16_t* PageTitle(int page) {
    return page >= 0 && page < kPageCount ? kPageTitles[page] : u"";
}

std::u16string PageCaption(int page, int unread) {
    char count[16];
    std::snprintf(count, sizeof count, "(%d)", unread);
    return PageTitle(page) + Utf8ToUtf16(count);
}

std::u16string MessageBodyText(const SmsRecord& record) {
    const int length = std::clamp<int>(record.length, 0, static_cast<int>(sizeof record.text));
    if (record.coding == 8) {
        uint8_t bytes[sizeof record.text / 2];
        const int count = HexToBytes(record.text, length, bytes, sizeof bytes);
        char16_t wide[sizeof record.text / 2 + 1];
        const int units = Ucs2BytesToWide(bytes, count, wide, sizeof wide / sizeof wide[0]);
        return std::u16string(wide, static_cast<size_t>(units));
    }
    std::u16string text;
    for (int i = 0; i < length && record.text[i] != '\0'; ++i)
        text.push_back(SmsTextToWide(record.text[i]));
    return text;
}

std::u16string MessagePreviewText(const SmsRecord& record) {
    return OneLine(MessageBodyText(record));
}

bool FillFolderPages(MessageStore& store, const NameLookup& names,
                     const std::function<void()>& taken, FolderListing* listing) {
    for (auto& page : listing->pages)
        page.clear();
    listing->unread.fill(0);
    SettingsStore& settings = store.settings;

    std::vector<SmsRecord> records;
    const bool simRead = StoreReadAll(store, kFolderSim, &records);
    for (const SmsRecord& record : records) {
        const int page = SimPage(record);
        const bool isNew = IndexListContains(settings, kNewIdx, record.index) == 1;
        if (isNew) {
            IndexListRemove(settings, kNewIdx, record.index);
            if (taken) taken();
        }
        if (page < 0) continue;
        FolderRow row = MakeRow(kFolderSim, record, names);
        row.unread = StatusIs(record, "REC UNREAD") || isNew ||
                     IndexListContains(settings, kUnreadIdx, record.index) == 1;
        if (row.unread) IndexListAdd(settings, kUnreadIdx, record.index);
        listing->pages[page].push_back(std::move(row));
    }
    for (int page : {kPageInbox, kPageOutbox, kPageSent}) {
        JoinParts(listing->pages[page]);
        for (const FolderRow& row : listing->pages[page])
            listing->unread[page] += row.unread ? 1 : 0;
    }

    StoreReadAll(store, kFolderLocal, &records);
    for (const SmsRecord& record : records) {
        const int page = LocalPage(record);
        if (page >= 0) listing->pages[page].push_back(MakeRow(kFolderLocal, record, names));
    }
    for (auto& page : listing->pages)
        SortNewestFirst(page);
    return simRead;
}

int PasteIntoPage(MessageStore& store, Link& link, int page, const FolderUi& ui) {
    if (page < 0 || page >= kPageCount) return 0;
    const std::vector<ClipboardEntry> entries = ClipboardRead(store);
    if (entries.empty()) return 0;
    Begin(ui);
    int filed = 0;
    if (page == kPageOutbox && SmsStorageFull(link) == 1) {
        Box(ui, u"Cannot paste message.", u"Error!");
        ClipboardRemove(store);
        End(ui);
        return 0;
    }
    for (const ClipboardEntry& entry : entries) {
        SmsRecord record = entry.record;
        // A cut takes the message out of the page it came from first.
        if (entry.cut == 1 && !StoreDelete(store, FolderOfPage(entry.sourcePage - 1), record.index))
            break;
        switch (page) {
            case kPageInbox:
                // The SIM keeps one message a location: a copy listed already is replaced.
                StoreDelete(store, kFolderSim, record.index);
                if (StoreAppend(store, kFolderSim, record)) ++filed;
                break;
            case kPageOutbox:
                if (SmsSetFormat(link, kSmsModePdu) != 0) {
                    Box(ui, u"Failed to write message to Own folder.", u"Error");
                    continue;
                }
                if (!SmsWrite(link, kSmsModePdu, &record)) {
                    Box(ui, u"Cannot write message to Own folder.", u"Error");
                    continue;
                }
                if (StoreAppend(store, kFolderSim, record)) ++filed;
                break;
            default:
                if (page == kPageDraft) {
                    SetStatus(record, "PDA DRAFT");
                    std::memset(record.number, 0, sizeof record.number);
                    std::memset(record.date, 0, sizeof record.date);
                } else if (page == kPagePda) {
                    SetStatus(record, "PDA PDA");
                }
                record.index = StoreNextIndex(store, kFolderLocal);
                if (StoreAppend(store, kFolderLocal, record)) ++filed;
                break;
        }
    }
    ClipboardRemove(store);
    End(ui);
    return filed;
}

int DeleteMessages(MessageStore& store, Link& link, const std::vector<FolderRow>& rows,
                   const FolderUi& ui, const std::function<void()>& simFullCleared) {
    Begin(ui);
    int result = 1;
    for (const FolderRow& row : rows) {
        bool ok = true;
        // A concatenated message goes with all its parts.
        const std::vector<int> indices =
            row.parts.empty() ? std::vector<int>{row.record.index} : row.parts;
        for (int index : indices) {
            if (row.folder == kFolderSim) {
                IndexListRemove(store.settings, kUnreadIdx, index);
                ok = SmsDelete(link, index) == 0;
                if (ok && simFullCleared) simFullCleared();
            }
            ok = ok && StoreDelete(store, row.folder, index) == 1;
            if (!ok) break;
        }
        if (!ok) {
            Box(ui, u"Cannot delete message.", u"Error!");
            result = 0;
            break;
        }
    }
    End(ui);
    return result;
}

int OpenMessage(MessageStore& store, const FolderRow& row) {
    if (row.folder != kFolderSim || !row.unread) return 0;
    int changed = 1;
    for (int index : row.parts.empty() ? std::vector<int>{row.record.index} : row.parts) {
        changed = StoreSetStatus(store, kFolderSim, index, "REC READ") && changed;
        IndexListRemove(store.settings, kUnreadIdx, index);
    }
    return changed;
}

int SendStoredMessage(MessageStore& store, Link& link, const FolderRow& row, const FolderUi& ui) {
    if (row.folder != kFolderSim || !SmsSendStored(link, row.record.index)) {
        Box(ui, u"Cannot send message. Please check the SMSC setting or try again later.",
            u"Error");
        return 0;
    }
    SmsRecord sent = row.record;
    StampLocalTime(&sent);
    SetStatus(sent, "STO SENT");
    sent.index = StoreNextIndex(store, kFolderLocal);
    StoreAppend(store, kFolderLocal, sent);
    Box(ui, u"Message has been sent.", u"VQM Dialer");
    return 1;
}

}  // namespace vqm
