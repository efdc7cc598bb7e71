// The threads that fill the phonebook caches: the SIM builder reads the SIM's and the card's own
// phonebooks over the link in runs of ten; the address-book builder copies every desktop
// contact that has a number into the mobile, home and work files. Each owns its group's write
// state for its whole run and, however it ends, reports with its message (1224 SIM, 1124
// address book) to whoever asked for the build.
#pragma once

#include <functional>
#include <string>

#include "contacts/address_book.h"
#include "contacts/phonebook_cache.h"

namespace vqm {

struct Link;

inline constexpr unsigned kOutlookCacheDone = 1124;  // WM_USER + 100
inline constexpr unsigned kSimCacheDone = 1224;      // WM_USER + 200

// Delivers a builder's message to the window that asked for the build (from the builder's own
// thread: the window's side moves it to the window's thread).
using CacheNotify = std::function<void(unsigned msg)>;
// Reads the desktop address book for the builder (ReadDesktopAddressBook in the program).
using AddressBookReader = std::function<AddressBookResult()>;
// Shows the one message the address-book builder has for a person.
using CacheErrorBox = std::function<void(const std::u16string& text)>;

// The SIM builder's work on the calling thread: both files are deleted first, so the build
// never lands behind what an earlier run or a damaged file left; then "SM" into file 1 and "ME"
// into file 2, in runs of ten up to each storage's total, stopping a storage once its used
// count is read. A storage that cannot be selected, or a run that gets no reply (the card was
// pulled), ends the build; what was read stays in the files. Sends 1224 at the end, and when
// the group is busy (then nothing is touched).
void SimCacheBuild(PhonebookCaches& caches, Link& link, const CacheNotify& notify);
// A cache that is present (an empty file counts) is reported done after 500 ms without a word
// to the card; otherwise the builder thread starts.
void SimCacheLoad(PhonebookCaches& caches, Link& link, CacheNotify notify);
// Deletes the SIM cache, present or damaged, and starts the builder thread.
void SimCacheRebuild(PhonebookCaches& caches, Link& link, CacheNotify notify);
// True from the moment SimCacheLoad or SimCacheRebuild starts a builder thread until that
// thread has let the group go, just before its 1224. Meanwhile the files are missing or partial,
// so a free place found in them may be taken on the card.
bool SimCacheBuilding(const PhonebookCaches& caches);

// The address-book builder's work on the calling thread. A source that cannot be loaded at all
// shows "<library> is missing." through box; an empty one writes nothing and leaves the lock
// alone. Sends 1124 on every way out.
void OutlookCacheBuild(PhonebookCaches& caches, const AddressBookReader& read,
                       const CacheErrorBox& box, const CacheNotify& notify);
// Deletes the address-book cache (present or damaged), waits 500 ms and reports 1124 (from a
// thread, so the caller is not held).
void OutlookCacheClear(PhonebookCaches& caches, CacheNotify notify);
// Deletes the address-book cache (present or damaged) and starts the builder thread.
void OutlookCacheRebuild(PhonebookCaches& caches, AddressBookReader read, CacheErrorBox box,
                         CacheNotify notify);

// The three records of one contact as the builder writes them: the file-as name cut to 127
// bytes, each number reduced by CopyNumberText and cut to 31 bytes. The lengths say which
// files the contact goes to (mobile > 0; any home or work number of 1 or more).
struct OutlookRecords {
    OutlookMobileRecord mobile;
    OutlookNumbersRecord home, work;
    int mobileLength;
    int homeLengths[3], workLengths[3];
};
OutlookRecords MakeOutlookRecords(const AddressBookContact& contact);

}  // namespace vqm
