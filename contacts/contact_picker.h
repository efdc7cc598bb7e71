// What the contact picker (CONTACTS_VIEW) decides, apart from its widgets: the rows of its five
// pages from the phonebook caches, the recipients text its OK hands to the Write SMS view, and
// when it clears, loads or rebuilds the caches as it comes up. No Qt.
#pragma once

#include <array>
#include <string>
#include <vector>

#include "contacts/phonebook_cache.h"

namespace vqm {

inline constexpr int kPickerSimPage = 0, kPickerCardPage = 1, kPickerMobilePage = 2,
                     kPickerHomePage = 3, kPickerWorkPage = 4, kPickerPageCount = 5;

struct PickerRow {
    std::u16string name, number;
};
using PickerRows = std::array<std::vector<PickerRow>, kPickerPageCount>;
using PickerTicks = std::array<std::vector<bool>, kPickerPageCount>;

// A page's rows from its cache file, read under its group's read lock and sorted by name (the
// support library's text comparison, ascending; equal names keep the file's order). SIM Card
// and Card Phone list every record; Mobile those with a number; Home and Work those whose first
// number is not empty (a contact with only a second number or a fax is left off). False when
// the group is busy; rows is then empty.
bool LoadPickerRows(PhonebookCaches& caches, int page, std::vector<PickerRow>* rows);

// OK's text: pages in the order SIM Card, Card Phone, Mobile, Home, Work, rows in list order,
// each ticked row as "name<number>;\r\n" (name up to 64 characters, number up to 32).
std::u16string PickedRecipients(const PickerRows& rows, const PickerTicks& ticked);

// Sizes and times of the five cache files: a change means the lists must be read again.
std::string PickerCacheSignature(PhonebookCaches& caches);

// The load state and the work each event asks of the view.
struct PickerLoadState {
    bool activated = false;  // the first activation has been seen
    bool simRequested = false;
    bool loaded = false;    // the SIM load reported back
    std::string signature;  // of the caches the lists were read from
};
enum PickerWork : unsigned {
    kPickerNoWork = 0,
    kPickerOutlookClear = 1u << 0,
    kPickerSimLoad = 1u << 1,
    kPickerReloadOutlook = 1u << 2,  // the Mobile, Home and Work lists
    kPickerReloadSim = 1u << 3,      // the SIM Card and Card Phone lists
    kPickerClearTicks = 1u << 4,
};
// 2025. cardState as the card watch keeps it (2 ready); signature of the caches now.
unsigned PickerActivated(PickerLoadState& state, int cardState, const std::string& signature);
// 1124 and 1224.
unsigned PickerOutlookDone(PickerLoadState& state, int cardState);
unsigned PickerSimDone(PickerLoadState& state, const std::string& signature);

}  // namespace vqm
