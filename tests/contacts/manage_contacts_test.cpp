// The Manage Contacts view's decisions without widgets: the dialog checks at their boundaries,
// the number type, Find's two-way rule and walk, the recipients text, and the load state
// machine on card state, activation and the two builders' reports.
#include "contacts/manage_contacts.h"

#include <gtest/gtest.h>

#include <string>
#include <vector>

#include "contacts/phonebook_at.h"
#include "support/settings_store.h"
#include "tests/common/temp_folder.h"

namespace vqm {
namespace {

TEST(ManageContactsTest, DialogChecksInTheirOrder) {
    struct Case {
        std::u16string name, number;
        ContactCheck check;
        std::u16string message;
    };
    const std::u16string fourteen(14, u'a');
    const Case cases[] = {
        {u"", u"123", ContactCheck::KeepOpen, u""},
        {u"", u"", ContactCheck::KeepOpen, u""},
        {fourteen, u"123", ContactCheck::Ok, u""},  // exactly the limit
        {fourteen + u"b", u"123", ContactCheck::Refused,
         u"Contact name cannot longer than 14 characters."},
        {u"Ann", u"", ContactCheck::KeepOpen, u""},
        {u"Ann", std::u16string(20, u'1'), ContactCheck::Ok, u""},
        {u"Ann", std::u16string(21, u'1'), ContactCheck::Refused,
         u"Contact number cannot more than 20 digits."},
        // The character check comes before the length check, and says which character.
        {u"Jos\u00E9" + fourteen, u"1", ContactCheck::Refused,
         u"Contact name cannot have non-English characters.\n\"\u00E9\" (U+00E9) cannot be "
         u"stored."},
        {u"\u4E2D", u"1", ContactCheck::Refused,
         u"Contact name cannot have non-English characters.\n\"\u4E2D\" (U+4E2D) cannot be "
         u"stored."},
        {u"Tab\tName", u"1", ContactCheck::Refused,
         u"Contact name cannot have non-English characters.\nU+0009 cannot be stored."},
    };
    for (const Case& c : cases) {
        const ContactCheckResult result = CheckContact(c.name, c.number, 14, 20);
        EXPECT_EQ(result.check, c.check) << std::string(c.name.begin(), c.name.end());
        EXPECT_EQ(result.message, c.message);
    }
    // Only 32 characters of a field are read.
    EXPECT_EQ(CheckContact(std::u16string(40, u'a'), u"1", 32, 20).check, ContactCheck::Ok);
}

TEST(ManageContactsTest, NumberTypeAndRecipientText) {
    EXPECT_EQ(NumberType(u"+441234"), 145);
    EXPECT_EQ(NumberType(u"0044+1"), 129);
    EXPECT_EQ(NumberType(u""), 129);
    EXPECT_EQ(RecipientText(u"Ann", u"+441234"), u"Ann<+441234>;\r\n");
    EXPECT_EQ(RecipientText(std::u16string(70, u'n'), std::u16string(40, u'1')),
              std::u16string(64, u'n') + u"<" + std::u16string(32, u'1') + u">;\r\n");
}

TEST(ManageContactsTest, FindMatchesBothWaysAndWrapsOnce) {
    struct Case {
        std::u16string name, search;
        bool matches;
    };
    const Case cases[] = {
        {u"Anna Berg", u"berg", true},       // the search text in a longer name
        {u"Anna Berg", u"ANNA", true},       // without regard to case
        {u"Bo", u"Bo Ek and others", true},  // a longer search text holding the name
        {u"Bo Ek", u"bo ek", true},          // equal lengths: the name in the search text
        {u"Anna", u"Annabel", true},         // the two-way rule: the name is in the search
        {u"Annabel", u"Anna B", false},     {u"Anna Berg", u"Olof", false}, {u"", u"x", false},
    };
    for (const Case& c : cases)
        EXPECT_EQ(FindMatches(c.name, c.search), c.matches)
            << std::string(c.name.begin(), c.name.end());

    const std::vector<std::u16string> names = {u"Anna", u"Bob", u"Joanna", u"Olof"};
    EXPECT_EQ(FindNext(names, u"anna", -1), 0);
    EXPECT_EQ(FindNext(names, u"anna", 0), 2);
    EXPECT_EQ(FindNext(names, u"anna", 2), 0);  // round to the top
    EXPECT_EQ(FindNext(names, u"bob", 1), 1);   // the only hit, found again
    EXPECT_EQ(FindNext(names, u"zed", -1), -1);
}

TEST(ManageContactsTest, StorageLimitsComeFromTheLearntGeometry) {
    const testing::TempFolder temp;
    SettingsStore settings(temp / "settings.db");
    EXPECT_EQ(ReadStorageLimits(settings, "SM").textLength, 0);  // never learnt
    PhonebookSaveGeometry(settings, "sm", 20, 14, 250);
    PhonebookSaveGeometry(settings, "me", 40, 18, 100);
    const StorageLimits sim = ReadStorageLimits(settings, "SM");
    const StorageLimits card = ReadStorageLimits(settings, "ME");
    EXPECT_EQ(sim.numberLength, 20);
    EXPECT_EQ(sim.textLength, 14);
    EXPECT_EQ(sim.total, 250);
    EXPECT_EQ(card.total, 100);
}

// The load state machine, step by step, as a user's session goes.
TEST(ManageContactsTest, LoadStateMachine) {
    ContactsLoadState s;
    // The first activation with the card connected clears the address-book cache first...
    EXPECT_EQ(ContactsActivated(s, 2), kWorkOutlookClear);
    EXPECT_EQ(s.outlook, 1);
    // Its 1124 loads the SIM cache.
    EXPECT_EQ(ContactsOutlookDone(s, 2), unsigned{kWorkForwardOutlook | kWorkSimLoad});
    EXPECT_EQ(s.outlook, 2);
    EXPECT_EQ(s.sim, 1);
    // 1224: lists and geometry; no start-up rebuild ran, so later activations stay quiet.
    EXPECT_EQ(ContactsSimDone(s), unsigned{kWorkForwardSim | kWorkLearnGeometry});
    EXPECT_TRUE(s.pending);
    EXPECT_EQ(ContactsActivated(s, 2), kWorkNone);
    // An activation before that 1124 loads the SIM cache itself; the 1124 then only lists.
    ContactsLoadState early;
    ContactsActivated(early, 2);
    EXPECT_EQ(ContactsActivated(early, 2), kWorkSimLoad);
    EXPECT_EQ(ContactsOutlookDone(early, 2), kWorkForwardOutlook);
    EXPECT_TRUE(early.pending);
    // The card goes: everything starts over.
    EXPECT_EQ(ContactsCardStateChanged(s, 1, false, 1, 1), kWorkEmptySimLists);
    EXPECT_EQ(s.outlook, 0);
    EXPECT_FALSE(s.pending);

    // Card-ready with another view shown honours the General page's two settings.
    struct Case {
        int32_t sim, outlook;
        unsigned work;
    };
    const Case cases[] = {{0, 0, kWorkNone},
                          {1, 0, kWorkSimRebuild},
                          {0, 1, kWorkOutlookRebuild},
                          {1, 1, kWorkSimRebuild | kWorkOutlookRebuild},
                          {2, 5, kWorkNone}};  // only exactly 1 counts
    for (const Case& c : cases) {
        ContactsLoadState t;
        EXPECT_EQ(ContactsCardStateChanged(t, 2, false, c.sim, c.outlook), c.work);
        EXPECT_EQ(t.startupRebuild, c.sim == 1);
    }
    // With Manage Contacts shown the change is an activation.
    ContactsLoadState shown;
    EXPECT_EQ(ContactsCardStateChanged(shown, 2, true, 1, 1), kWorkOutlookClear);

    // A start-up SIM rebuild's 1224 leaves the pending flag clear, so the next 1124 loads.
    ContactsLoadState startup;
    ContactsCardStateChanged(startup, 2, false, 1, 0);
    ContactsSimDone(startup);
    EXPECT_FALSE(startup.pending);
    EXPECT_EQ(ContactsActivated(startup, 2), kWorkOutlookClear);
    EXPECT_EQ(ContactsOutlookDone(startup, 2), kWorkForwardOutlook);  // SIM state is set
    EXPECT_TRUE(startup.pending);
    // A 1124 while the card is away waits for the card.
    ContactsLoadState away;
    EXPECT_EQ(ContactsOutlookDone(away, 1), kWorkForwardOutlook);
    EXPECT_TRUE(away.pending);
}

}  // namespace
}  // namespace vqm
