// What the SMS Folder view does with the store, without its widgets: which page each message
// goes to and how it is shown, filing the transfer file into a page (paste), deleting, opening
// an unread message and sending a stored one. The view (sms_folder_view.h) only shows the rows
// and passes the user's taps here.
#pragma once

#include <array>
#include <functional>
#include <string>
#include <vector>

#include "messaging/message_store.h"

namespace vqm {

struct Link;

inline constexpr char16_t kMemorySim[] = u"SIM";
inline constexpr char16_t kMemoryPda[] = u"PDA";

// One message as a list shows it.
struct FolderRow {
    int folder = kFolderSim;  // 1 SIM cache, 2 handheld folder
    SmsRecord record{};
    bool unread = false;
    std::u16string from;     // the sender's (or recipient's) name when known, else the number
    std::u16string body;     // the whole text; a concatenated message's parts in order
    std::u16string preview;  // the body on one line
    std::u16string date;
    // The locations this row stands for: one, or every part of a concatenated message.
    std::vector<int> parts;
};

struct FolderListing {
    std::array<std::vector<FolderRow>, kPageCount> pages;
    std::array<int, kPageCount> unread{};  // counted for Inbox, Outbox and Sent
};

// The name of a number from the phonebook caches; empty when unknown.
using NameLookup = std::function<std::u16string(const char* number)>;

// The body of a record as text: UCS2 from its hexadecimal digits, anything else through the
// display table of the 7-bit alphabet.
std::u16string MessageBodyText(const SmsRecord& record);
// The body for a list's column: line breaks as blanks.
std::u16string MessagePreviewText(const SmsRecord& record);

// Fills the five pages from both folders. Every SIM location found in "NewIdx" is taken out of
// it, and taken() is told once for each; unread messages join "UnreadIdx". The rows of each
// page are sorted newest first. Returns false when the SIM cache could not be read (the store
// was busy); the handheld folder is listed all the same.
bool FillFolderPages(MessageStore& store, const NameLookup& names,
                     const std::function<void()>& taken, FolderListing* listing);

// The caption of a page with its unread count: "Inbox(2)".
std::u16string PageCaption(int page, int unread);
const char16_t* PageTitle(int page);

// What the folder operations ask of the user interface.
struct FolderUi {
    // A message box (text, title); its answer is not needed here.
    std::function<void(const std::u16string& text, const std::u16string& title)> box;
    std::function<void()> beginBusy, endBusy;
};

// Files every entry of the transfer file into page (0..4) and removes the file. Outbox entries
// are written to the SIM first. Returns the number of entries filed.
int PasteIntoPage(MessageStore& store, Link& link, int page, const FolderUi& ui);

// Deletes the messages (SIM ones on the card first) in turn; the first failure stops with
// "Cannot delete message.". simFullCleared runs after each SIM delete. 1 when all went.
int DeleteMessages(MessageStore& store, Link& link, const std::vector<FolderRow>& rows,
                   const FolderUi& ui, const std::function<void()>& simFullCleared);

// An unread message opened: "REC READ" in the SIM cache and out of "UnreadIdx".
int OpenMessage(MessageStore& store, const FolderRow& row);

// Sends a stored Outbox message and files the sent copy in the handheld folder. 1 when sent.
int SendStoredMessage(MessageStore& store, Link& link, const FolderRow& row, const FolderUi& ui);

}  // namespace vqm
