// What the Manage Contacts view decides, apart from its widgets: the checks of the contact
// dialogs, the type of a number, Find's matching rule and walk, the text a contact gives the
// Write SMS view, and the load state machine that drives the cache builders. No Qt.
#pragma once

#include <cstdint>
#include <string>
#include <vector>

namespace vqm {

class SettingsStore;

// The New/Edit/Copy dialogs' check on OK against the target storage's limits.
enum class ContactCheck {
    Ok,
    KeepOpen,  // the name or number is empty: the dialog stays open without a word
    Refused,   // a message says why
};
struct ContactCheckResult {
    ContactCheck check = ContactCheck::KeepOpen;
    std::u16string message;
};
// name and number as typed (the dialogs read at most 32 characters of each); the limits are
// the storage's "<code>_tlength" and "<code>_nlength".
ContactCheckResult CheckContact(const std::u16string& name, const std::u16string& number,
                                int32_t textLimit, int32_t numberLimit);
// The refusal of a name with a character a SIM cannot keep, naming the first such character.
std::u16string NonEnglishMessage(const std::u16string& name);

// 145 for an international number (one that begins with "+"), else 129.
int NumberType(const std::u16string& number);

// The target storage's limits, from "sm_..." for "SM" and "me_..." for anything else. Missing
// settings read as 0 (a limit of 0 lets nothing through, as on a card whose geometry was never
// learnt).
struct StorageLimits {
    int32_t numberLength = 0, textLength = 0, total = 0;
};
StorageLimits ReadStorageLimits(SettingsStore& settings, const std::string& storageCode);

// Find's rule on one row: with the name longer than the search text, the search text must be
// in the name; otherwise the name must be in the search text. Both sides lower-cased; an empty
// name never matches.
bool FindMatches(const std::u16string& name, const std::u16string& search);
// The next row from after lastHit (-1: from the top) whose name matches, wrapping round once to
// the top; -1 when none does.
int FindNext(const std::vector<std::u16string>& names, const std::u16string& search, int lastHit);

// "name<number>;\r\n": one recipient for the Write SMS view (name read up to 64 characters,
// number up to 32).
std::u16string RecipientText(const std::u16string& name, const std::u16string& number);

// The view's load states and the work each message asks for.
struct ContactsLoadState {
    int outlook = 0;  // 0 not started, 1 loading, 2 loaded
    int sim = 0;
    bool pending = false;
    bool startupRebuild = false;  // a SIM rebuild asked for at card-ready is running
};
enum ContactsWork : unsigned {
    kWorkNone = 0,
    kWorkEmptySimLists = 1u << 0,
    kWorkOutlookRebuild = 1u << 1,
    kWorkSimRebuild = 1u << 2,
    kWorkOutlookClear = 1u << 3,
    kWorkSimLoad = 1u << 4,
    kWorkForwardOutlook = 1u << 5,  // the Outlook pages reload
    kWorkForwardSim = 1u << 6,      // the SIM and Card Phone pages reload
    kWorkLearnGeometry = 1u << 7,   // "me_..." then "sm_..." from the card
};
// 2026: the card state changed. viewCurrent: Manage Contacts is the view shown (the change is
// then taken as an activation). refreshSim/refreshOutlook: "GeneralRefreshSim" and
// "GeneralRefreshOutlook" as read.
unsigned ContactsCardStateChanged(ContactsLoadState& state, int cardState, bool viewCurrent,
                                  int32_t refreshSim, int32_t refreshOutlook);
// 2025: the view was shown.
unsigned ContactsActivated(ContactsLoadState& state, int cardState);
// 1124 and 1224.
unsigned ContactsOutlookDone(ContactsLoadState& state, int cardState);
unsigned ContactsSimDone(ContactsLoadState& state);

}  // namespace vqm
