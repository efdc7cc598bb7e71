// The five contact lists that Manage Contacts and the contact picker both show: "SIM Card",
// "Card Phone" and "Outlook" under one tab strip, the last holding "Mobile", "Home" and "Work"
// under a strip of its own. Page numbers: 0 SIM, 1 Card Phone, 2 to 4 Mobile, Home, Work.
#pragma once

#include <functional>
#include <string>

#include "shell/views.h"

class QWidget;

namespace vqm {

inline constexpr int kContactPageCount = 5;

std::u16string ContactPageTitle(int page);

// Builds both strips and their pages in view, which spans the given height; makeList fills
// page n's window with its list. Page windows are named "<classPrefix>_SIM_PAGE" and so on.
void CreateContactPages(View* view, const std::string& classPrefix, int tabId, int outlookTabId,
                        ViewSet& pages, ViewSet& outlookPages,
                        const std::function<void(QWidget* page, int n)>& makeList);

}  // namespace vqm
