#include "contacts/contact_pages_view.h"

#include <QRect>

namespace vqm {

namespace {

struct PageName {
    const char16_t* title;
    const char* classSuffix;
};
constexpr PageName kTopPages[3] = {
    {u"SIM Card", "_SIM_PAGE"}, {u"Card Phone", "_CARD_PAGE"}, {u"Outlook", "_OUTLOOK_PAGE"}};
constexpr PageName kOutlookPages[3] = {{u"Mobile", "_OUTLOOK_MOBILE_PAGE"},
                                       {u"Home", "_OUTLOOK_HOME_PAGE"},
                                       {u"Work", "_OUTLOOK_WORK_PAGE"}};
constexpr int kFirstOutlookPage = 2;

}  // namespace

std::u16string ContactPageTitle(int page) {
    if (page < 0 || page >= kContactPageCount) return u"";
    if (page >= kFirstOutlookPage) return kOutlookPages[page - kFirstOutlookPage].title;
    return kTopPages[page].title;
}

void CreateContactPages(View* view, const std::string& classPrefix, int tabId, int outlookTabId,
                        ViewSet& pages, ViewSet& outlookPages,
                        const std::function<void(QWidget* page, int n)>& makeList) {
    for (int i = 0; i < 3; ++i) {
        ViewRecord record;
        record.caption = kTopPages[i].title;
        record.className = classPrefix + kTopPages[i].classSuffix;
        record.windowProc = [&outlookPages, classPrefix, makeList, i](QWidget* parent) -> View* {
            auto* page = new View(parent);
            if (i < kFirstOutlookPage) {
                makeList(page, i);
                return page;
            }
            // Outlook holds its three pages under a tab strip of its own.
            for (int j = 0; j < 3; ++j) {
                ViewRecord inner;
                inner.caption = kOutlookPages[j].title;
                inner.className = classPrefix + kOutlookPages[j].classSuffix;
                inner.windowProc = [makeList, j](QWidget* innerParent) -> View* {
                    auto* innerPage = new View(innerParent);
                    makeList(innerPage, kFirstOutlookPage + j);
                    return innerPage;
                };
                outlookPages.records.push_back(std::move(inner));
            }
            return page;
        };
        pages.records.push_back(std::move(record));
    }
    CreateTabbedPages(view, tabId, pages, QRect(0, 0, view->width(), view->height()));
    if (View* outlook = pages.records[kFirstOutlookPage].window)
        CreateTabbedPages(outlook, outlookTabId, outlookPages, outlook->rect());
    for (int id : {tabId, outlookTabId})
        FitTabTitles(view, id);
}

}  // namespace vqm
