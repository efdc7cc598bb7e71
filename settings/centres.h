// The user's list of message centres, kept in settings: each entry's name, number, validity and
// "Sent As" text under N-indexed keys, the count, the chosen entry and whether the SIM's own
// centre is used instead. And what choosing one sends to the card.
#pragma once

#include <cstdint>
#include <string>
#include <vector>

namespace vqm {

struct Link;
class SettingsStore;

inline constexpr int kValidityChoiceCount = 6;
inline constexpr int kSendAsChoiceCount = 4;
// The validity texts in the dialog's order, and the "Sent As" choices.
extern const char16_t* const kValidityChoices[kValidityChoiceCount];
extern const char16_t* const kSendAsChoices[kSendAsChoiceCount];
// What an entry without a saved value shows.
inline constexpr char16_t kDefaultCentreName[] = u"Nil";
inline constexpr char16_t kDefaultCentreNumber[] = u"12345678";
inline constexpr char16_t kDefaultValidity[] = u"1 week";
inline constexpr char16_t kDefaultSendAs[] = u"Text";
// A stored count above this is taken as this: no list is that long, and a damaged value
// must not have the page read a billion keys.
inline constexpr int kMaxCentres = 100;
// The value sent with "AT+CSMP" when the SIM's own centre is used.
inline constexpr int kSimDefaultValidity = 167;

struct CentreEntry {
    std::u16string name = kDefaultCentreName;
    std::u16string number = kDefaultCentreNumber;
    std::u16string validity = kDefaultValidity;
    std::u16string sendAs = kDefaultSendAs;
    bool operator==(const CentreEntry&) const = default;
};

struct CentreList {
    // "SettingsMessagesUseSIMDefault" as read; absent reads as 1 and simDefaultAbsent is set,
    // which asks the page to apply the SIM default.
    bool useSimDefault = true;
    bool simDefaultAbsent = false;
    int chosen = -1;  // -1 none; an out-of-range stored value reads as -1
    std::vector<CentreEntry> entries;
};

// The number "AT+CSMP=%d" carries for a validity text: the first of "1 hour", "6 hours",
// "24 hours", "72 hours", "1 week", "Maximum time" that the text contains gives 0, 5, 23, 71,
// 167 or 255; anything else 0.
int ValidityValue(const std::u16string& text);

CentreList LoadCentres(SettingsStore& store);
// Writes entry index (0-based) of the list; index == count adds one at the end.
void SaveCentre(SettingsStore& store, int index, const CentreEntry& entry);
// Removes entry index: the later ones move down a place so the keys stay 0 .. count - 1, and
// the chosen entry follows its centre (none when it was the one removed). Returns the new
// chosen index.
int DeleteCentre(SettingsStore& store, int index);
void SaveChosenCentre(SettingsStore& store, int chosen);
void SaveUseSimDefault(SettingsStore& store, bool use);

// "AT+CSCA" with the entry's number and "AT+CSMP" with its validity's value: 1 on success.
int PushCentre(Link& link, const CentreEntry& entry);
// The card's own centre: an empty number and 167. 1 on success.
int PushSimDefault(Link& link);

}  // namespace vqm
