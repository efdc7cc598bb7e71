// The Settings view and its General, Messages, Network and Modem pages offscreen, the pages
// talking to the simulated card in both of its personalities: what each action leaves on the
// card, in the settings and in the driver files, the boxes shown, and a card that stops
// answering or is pulled while an exchange waits.
#include <gtest/gtest.h>

#include <stdlib.h>
#include <QAbstractButton>
#include <QApplication>
#include <QCheckBox>
#include <QComboBox>
#include <QElapsedTimer>
#include <QLabel>
#include <QLineEdit>
#include <QListWidget>
#include <QPushButton>
#include <QRadioButton>
#include <QTabBar>
#include <QTreeWidget>
#include <algorithm>
#include <array>
#include <chrono>
#include <filesystem>
#include <fstream>
#include <functional>
#include <memory>
#include <sstream>
#include <string>
#include <thread>
#include <vector>

#include "cardsim/card_sim.h"
#include "link/link.h"
#include "settings/centre_page.h"
#include "settings/general_page.h"
#include "settings/modem_page.h"
#include "settings/network_page.h"
#include "settings/settings_view.h"
#include "shell/dialogs.h"
#include "shell/messages.h"
#include "support/settings_store.h"
#include "tests/common/link_waits.h"
#include "tests/common/temp_folder.h"

namespace vqm {
namespace {

using cardsim::CardSim;
using cardsim::Dialect;
using cardsim::SimConfig;

std::string ReadAll(const std::string& path) {
    std::ifstream in(path, std::ios::binary);
    std::ostringstream all;
    all << in.rdbuf();
    return all.str();
}

struct Box {
    std::u16string text;
    unsigned style;
};

class SettingsPagesTest : public ::testing::TestWithParam<Dialect> {
  protected:
    SettingsPagesTest() {
        SimConfig config;
        config.baud = 0;
        config.runtimeDir = temp_ / "run";
        config.stateFile = temp_ / "card.state";
        config.engine.dialect = GetParam();
        sim_ = std::make_unique<CardSim>(config);
        EXPECT_TRUE(sim_->PowerUp());
        testing::ShortenLinkWaits(link_);
        EXPECT_EQ(PortOpenDevice(link_, sim_->DevicePath().c_str()), 1);
        dialogs_.SetResponder([this](const DialogRequest& request) {
            if (request.isDialog) {
                if (dialogAnswers_.empty()) return kIdCancel;
                auto answer = std::move(dialogAnswers_.front());
                dialogAnswers_.erase(dialogAnswers_.begin());
                return answer(request.dialog);
            }
            boxes_.push_back({request.text, request.style});
            return kIdOk;
        });
        files_.registryRoot = temp_ / "registry";
        files_.wvdialPath = temp_ / "wvdialrc";
        // A whole Settings view writes the modem command where the user's own files are:
        // here, the test's folder.
        setenv("XDG_CONFIG_HOME", (temp_ / "config").c_str(), 1);
        setenv("VQM_WVDIAL_CONF", (temp_ / "view-wvdialrc").c_str(), 1);
        host_.resize(240, 294);
    }
    ~SettingsPagesTest() override {
        pages_.clear();
        PortClose(link_);
    }

    template <class Page, class... Args>
    Page& Make(Args&&... args) {
        auto page = std::make_unique<Page>(&host_, context_, std::forward<Args>(args)...);
        page->resize(240, 240);
        Page& made = *page;
        pages_.push_back(std::move(page));
        return made;
    }
    void Connected(View& page) { page.OnMessage(kMsgCardStateChanged, 2, 0); }

    // Runs the window's events until done holds; false after the time-out.
    static bool WaitFor(const std::function<bool()>& done, int ms = 8000) {
        QElapsedTimer timer;
        timer.start();
        while (!done()) {
            if (timer.elapsed() > ms) return false;
            QApplication::processEvents(QEventLoop::WaitForMoreEvents, 20);
        }
        return true;
    }
    template <class Page>
    void Settle(Page& page) {
        ASSERT_TRUE(WaitFor([&page] { return !page.Busy(); }));
        EXPECT_EQ(QApplication::overrideCursor(), nullptr);
    }

    // What the card itself reports now.
    std::string Card(const char* query) {
        char reply[512];
        const unsigned n = AtCommand(link_, query, reply, sizeof reply);
        return std::string(reply, n);
    }
    int Int(const char16_t* name) {
        int32_t value = -99;
        return GetSettingInt(settings_, name, &value) ? value : -99;
    }
    std::vector<std::u16string> Column(QTreeWidget* list, int column, int role = Qt::DisplayRole) {
        std::vector<std::u16string> out;
        for (int i = 0; i < list->topLevelItemCount(); ++i)
            out.push_back(list->topLevelItem(i)->data(column, role).toString().toStdU16String());
        return out;
    }

    testing::TempFolder temp_;
    SettingsStore settings_{temp_ / "settings.db"};
    Link link_{settings_, DriverRoots{temp_ / "run", temp_ / "tty"}};
    Dialogs dialogs_;
    ShellContext context_{settings_, link_, dialogs_, temp_ / "run"};
    std::unique_ptr<CardSim> sim_;
    ModemDriverFiles files_;
    QWidget host_;
    std::vector<std::unique_ptr<View>> pages_;
    std::vector<Box> boxes_;
    std::vector<std::function<int(QDialog*)>> dialogAnswers_;
};

INSTANTIATE_TEST_SUITE_P(Dialects, SettingsPagesTest,
                         ::testing::Values(Dialect::Card, Dialect::Standard), [](const auto& info) {
                             return info.param == Dialect::Card ? "Card" : "Standard";
                         });

TEST_P(SettingsPagesTest, ViewHasNinePagesInOrderAndFollowsTheCard) {
    int state = 1;
    SettingsView view(&host_, context_);
    view.SetCardStateSource([&state] { return state; });
    auto* tabs = qobject_cast<QTabBar*>(FindControl(&view, kSettingsTabId));
    ASSERT_NE(tabs, nullptr);
    std::vector<QString> titles;
    for (int i = 0; i < tabs->count(); ++i)
        titles.push_back(tabs->tabText(i));
    EXPECT_EQ(titles,
              (std::vector<QString>{"General", "Messages", "Network", "Call Forward",
                                    "Call Barring", "Security", "Modem", "Call Waiting", "Tones"}));
    EXPECT_TRUE(tabs->usesScrollButtons());
    EXPECT_EQ(view.Page(kSettingsNetwork)->objectName(), "SETTINGS_NETWORK_PAGE");
    // The Modem page wrote its command on creation, into the user's (here the test's) files.
    EXPECT_EQ(ReadAll(temp_ / "view-wvdialrc"),
              "[Dialer VQMFull]\nInit3 = AT+CBST=0,0,1;+CHSN=1,0,0,0\n");
    EXPECT_NE(dynamic_cast<ModemPage*>(view.Page(kSettingsModem)), nullptr);
    EXPECT_FALSE(view.isEnabled());
    state = 2;
    view.OnMessage(kMsgCardStateChanged, 0, 0);
    EXPECT_TRUE(view.isEnabled());
    // The Network page heard of the connection through the view.
    auto* network = dynamic_cast<NetworkPage*>(view.Page(kSettingsNetwork));
    ASSERT_TRUE(WaitFor([&] { return !network->Busy(); }));
    EXPECT_EQ(network->Operator()->text(), "COSMOTE");

    // Commands from outside pick a page, a row and a button, as taps would.
    SaveCentre(settings_, 0, CentreEntry{});
    auto* centres = dynamic_cast<CentrePage*>(view.Page(kSettingsMessages));
    // The connection had the page apply the SIM default; a tap meanwhile would be ignored.
    ASSERT_TRUE(WaitFor([&] { return !centres->Busy(); }));
    centres->Load(false);
    for (int id :
         {kSettingsPageCommandFirst + kSettingsMessages, kSettingsRowCommandFirst, kCentreSelectId})
        view.OnMessage(kWmCommand, id, 0);
    EXPECT_EQ(view.Pages().current, kSettingsMessages);
    ASSERT_TRUE(WaitFor([&] { return !centres->Busy(); }));
    EXPECT_EQ(Int(u"SettingsMessagesChosenCenter"), 0);
    EXPECT_NE(Card("AT+CSCA?\r").find("12345678"), std::string::npos);

    state = 1;
    view.OnMessage(kMsgCardStateChanged, 0, 0);
    EXPECT_FALSE(view.isEnabled());
}

TEST_P(SettingsPagesTest, GeneralPageReadsWithoutWritingAndWritesEachClick) {
    SetSettingInt(settings_, u"GeneralRefreshOutlook", std::array<int32_t, 1>{5}.data());
    GeneralPage& page = Make<GeneralPage>();
    EXPECT_FALSE(page.Box(kGeneralRefreshSimId)->isChecked());
    EXPECT_TRUE(page.Box(kGeneralRefreshOutlookId)->isChecked());
    EXPECT_EQ(settings_.TypeOf(u"GeneralRefreshSim"), SettingsStore::Type::Missing);
    EXPECT_EQ(Int(u"GeneralRefreshOutlook"), 5);  // read, not rewritten as 1
    page.Box(kGeneralRefreshSimId)->click();
    page.Box(kGeneralRefreshOutlookId)->click();
    EXPECT_EQ(Int(u"GeneralRefreshSim"), 1);
    EXPECT_EQ(Int(u"GeneralRefreshOutlook"), 0);
    page.Box(kGeneralRefreshSimId)->click();
    EXPECT_EQ(Int(u"GeneralRefreshSim"), 0);
    auto labels = page.findChildren<QLabel*>();
    std::vector<QString> texts;
    for (QLabel* label : labels)
        texts.push_back(label->text());
    EXPECT_NE(std::find(texts.begin(), texts.end(), "Refresh Outlook contacts \nwhen startup"),
              texts.end());
}

TEST_P(SettingsPagesTest, NetworkSearchRegisterAndAutomaticOnTheCard) {
    NetworkPage& page = Make<NetworkPage>();
    Connected(page);
    Settle(page);
    EXPECT_EQ(page.Operator()->text(), "COSMOTE");
    EXPECT_TRUE(page.AutomaticButton()->isChecked());
    EXPECT_FALSE(page.SearchButton()->isEnabled());

    // Manual before any search: no Register yet.
    page.ManualButton()->click();
    EXPECT_TRUE(page.SearchButton()->isEnabled());
    EXPECT_FALSE(page.RegisterButton()->isEnabled());
    ASSERT_EQ(sim_->Control("networks 20201:2,20205:1,21407:1,21402:1"), "OK");
    page.SearchButton()->click();
    Settle(page);
    std::vector<QString> listed;
    for (int i = 0; i < page.Networks()->count(); ++i)
        listed.push_back(page.Networks()->item(i)->text());
    EXPECT_EQ(listed, (std::vector<QString>{"COSMOTE", "PANAFON", "MOVISTAR", "MOVISTAR"}));
    EXPECT_TRUE(page.RegisterButton()->isEnabled());

    page.RegisterButton()->click();
    ASSERT_EQ(boxes_.size(), 1u);
    EXPECT_EQ(boxes_[0].text, u"Please select\na network first.");
    EXPECT_EQ(boxes_[0].style & 0xf0, 0x10u);

    const struct {
        int row;
        const char* code;
        const char16_t* shown;
    } registrations[] = {{1, "operator=20205", u"PANAFON"},
                         // Either MOVISTAR registers the table's first code.
                         {2, "operator=21402", u"MOVISTAR"}};
    for (const auto& r : registrations) {
        boxes_.clear();
        page.Networks()->setCurrentRow(r.row);
        page.RegisterButton()->click();
        Settle(page);
        ASSERT_EQ(boxes_.size(), 1u);
        EXPECT_EQ(boxes_[0].text, u"Network Registration Success.");
        EXPECT_EQ(boxes_[0].style & 0xf0, static_cast<unsigned>(kMbIconInformation));
        EXPECT_EQ(page.Operator()->text().toStdU16String(), r.shown);
        EXPECT_NE(sim_->Control("status").find(r.code), std::string::npos);
        EXPECT_NE(Card("AT+COPS?\r").find("+COPS: 1"), std::string::npos);
    }

    boxes_.clear();
    page.AutomaticButton()->click();
    Settle(page);
    EXPECT_TRUE(boxes_.empty());
    EXPECT_FALSE(page.SearchButton()->isEnabled());
    EXPECT_NE(Card("AT+COPS?\r").find("+COPS: 0"), std::string::npos);
    // Manual after a search that worked offers Register straight away.
    page.ManualButton()->click();
    EXPECT_TRUE(page.RegisterButton()->isEnabled());
}

TEST_P(SettingsPagesTest, CardGoneWhileASearchWaitsShowsTheErrorAndHangsNothing) {
    NetworkPage& page = Make<NetworkPage>();
    Connected(page);
    Settle(page);
    page.ManualButton()->click();
    ASSERT_EQ(sim_->Control("silent on"), "OK");
    page.SearchButton()->click();
    EXPECT_TRUE(page.Busy());
    EXPECT_NE(QApplication::overrideCursor(), nullptr);
    ASSERT_EQ(sim_->Control("pull"), "OK");
    Settle(page);
    ASSERT_EQ(boxes_.size(), 1u);
    EXPECT_EQ(boxes_[0].text, u"Network Search Error");
    // A search that failed first does not offer Register.
    EXPECT_FALSE(page.Searched());
    page.ManualButton()->click();
    EXPECT_FALSE(page.RegisterButton()->isEnabled());
    boxes_.clear();
    page.AutomaticButton()->click();
    Settle(page);
    ASSERT_EQ(boxes_.size(), 1u);
    EXPECT_EQ(boxes_[0].text, u"Network registration failure.");
    EXPECT_TRUE(page.ManualButton()->isChecked());  // the card was left as it was
}

TEST_P(SettingsPagesTest, CentresPushedToTheCardOnSelectAndSimDefault) {
    // Fresh settings: the SIM's own centre is applied when the page loads on the card.
    ASSERT_EQ(Card("AT+CSCA=\"+301234\"\r").find("OK") != std::string::npos, true);
    CentrePage& page = Make<CentrePage>();
    Connected(page);
    Settle(page);
    // An empty number sent to the card gives it back the centre its SIM holds.
    EXPECT_NE(Card("AT+CSCA?\r").find("+CSCA: \"+3097100000\""), std::string::npos);
    EXPECT_TRUE(page.List()->topLevelItemCount() == 0);
    EXPECT_FALSE(FindControl(&page, kCentreSelectId)->isEnabled());

    // New: an empty number is refused with its box and the dialog comes back.
    dialogAnswers_.push_back([](QDialog* d) {
        static_cast<CentreDialog*>(d)->number->clear();
        return kIdOk;
    });
    dialogAnswers_.push_back([](QDialog* d) {
        auto* dialog = static_cast<CentreDialog*>(d);
        dialog->name->setText("Home");
        dialog->number->setText("+306900000");
        dialog->validity->setCurrentText("24 hours");
        dialog->sendAs->setCurrentText("Fax");
        return kIdOk;
    });
    page.NewCentre();
    ASSERT_EQ(boxes_.size(), 1u);
    EXPECT_EQ(boxes_[0].text, u"Message center number must be existed.");
    dialogAnswers_.push_back([](QDialog* d) {
        EXPECT_EQ(static_cast<CentreDialog*>(d)->validity->currentText(), "1 week");
        static_cast<CentreDialog*>(d)->validity->setCurrentText("Maximum time");
        return kIdOk;
    });
    page.NewCentre();
    EXPECT_EQ(Column(page.List(), 0), (std::vector<std::u16string>{u"Home", u"Nil"}));
    EXPECT_EQ(Column(page.List(), 1), (std::vector<std::u16string>{u"+306900000", u"12345678"}));
    EXPECT_EQ(Column(page.List(), 2), (std::vector<std::u16string>{u"24 hours", u"Maximum time"}));
    EXPECT_EQ(Column(page.List(), 3), (std::vector<std::u16string>{u"Fax", u"Text"}));

    const struct {
        int row;
        const char* centre;
        const char* csmp;
    } selections[] = {{0, "+CSCA: \"+306900000\"", "+CSMP: 23,"},
                      {1, "\"12345678\"", "+CSMP: 255,"}};
    for (const auto& s : selections) {
        page.Select(s.row);
        Settle(page);
        EXPECT_NE(Card("AT+CSCA?\r").find(s.centre), std::string::npos) << s.row;
        EXPECT_NE(Card("AT+CSMP?\r").find(s.csmp), std::string::npos) << s.row;
        EXPECT_EQ(Int(u"SettingsMessagesChosenCenter"), s.row);
        EXPECT_EQ(Int(u"SettingsMessagesUseSIMDefault"), 0);
        EXPECT_EQ(
            Column(page.List(), 0, kCentreImageRole),
            (std::vector<std::u16string>{s.row == 0 ? u"1" : u"0", s.row == 1 ? u"1" : u"0"}));
    }

    // A centre the card refuses leaves the marks and the choice alone.
    dialogAnswers_.push_back([](QDialog* d) {
        static_cast<CentreDialog*>(d)->number->setText("not a number");
        return kIdOk;
    });
    page.NewCentre();
    page.Select(2);
    Settle(page);
    EXPECT_EQ(Int(u"SettingsMessagesChosenCenter"), 1);
    EXPECT_EQ(Column(page.List(), 0, kCentreImageRole),
              (std::vector<std::u16string>{u"0", u"1", u"0"}));
    EXPECT_NE(Card("AT+CSCA?\r").find("\"12345678\""), std::string::npos);
    page.List()->setCurrentItem(page.List()->topLevelItem(2));
    page.DeleteCentre();

    qobject_cast<QCheckBox*>(FindControl(&page, kCentreUseSimId))->click();
    Settle(page);
    EXPECT_NE(Card("AT+CSCA?\r").find("+CSCA: \"+3097100000\""), std::string::npos);
    EXPECT_NE(Card("AT+CSMP?\r").find("+CSMP: 167,"), std::string::npos);
    EXPECT_EQ(Int(u"SettingsMessagesUseSIMDefault"), 1);
    EXPECT_EQ(Column(page.List(), 0, kCentreImageRole), (std::vector<std::u16string>{u"0", u"0"}));

    // Delete the first: the second moves down, still chosen; a new page pushes it on load
    // once the SIM default is off again.
    page.List()->setCurrentItem(page.List()->topLevelItem(0));
    page.DeleteCentre();
    EXPECT_EQ(Column(page.List(), 0), (std::vector<std::u16string>{u"Nil"}));
    EXPECT_EQ(Int(u"SettingsMessagesChosenCenter"), 0);
    SetSettingInt(settings_, u"SettingsMessagesUseSIMDefault", std::array<int32_t, 1>{0}.data());
    CentrePage& again = Make<CentrePage>();
    Connected(again);
    Settle(again);
    EXPECT_NE(Card("AT+CSCA?\r").find("\"12345678\""), std::string::npos);
    EXPECT_EQ(Column(again.List(), 0, kCentreImageRole), (std::vector<std::u16string>{u"1"}));
}

// Deleting the centre the card uses gives the card the SIM's own centre, as "Use SIM Default"
// does; deleting any other changes nothing on the card. A card gone meanwhile leaves the box
// off, as any failed push does.
TEST_P(SettingsPagesTest, DeletingTheChosenCentreFallsBackToTheSimDefault) {
    const struct {
        int chosen;
        bool useSim;
        int deleted;
        bool pull;  // the card is pulled before the delete
        bool pushed, boxChecked;
        int chosenAfter;
        std::vector<std::u16string> marks;
        const char* centre;  // what the card reports afterwards; nullptr when pulled
        const char* csmp;
    } cases[] = {
        {1, false, 1, false, true, true, -1, {u"0", u"0"}, "+CSCA: \"+3097100000\"", "+CSMP: 167,"},
        {1, false, 0, false, false, false, 0, {u"1", u"0"}, "+CSCA: \"+302\"", "+CSMP: 23,"},
        // Already on the SIM's own centre: nothing to send.
        {1, true, 1, false, false, true, -1, {u"0", u"0"}, "+CSCA: \"+309\"", "+CSMP: 71,"},
        {0, false, 0, true, true, false, -1, {u"0", u"0"}, nullptr, nullptr},
    };
    int n = 0;
    for (const auto& c : cases) {
        SCOPED_TRACE(n++);
        SetSettingInt(settings_, u"SettingsMessagesCenters", std::array<int32_t, 1>{0}.data());
        for (const char16_t* number : {u"+301", u"+302", u"+303"}) {
            CentreEntry entry;
            entry.number = number;
            entry.validity = u"24 hours";
            SaveCentre(settings_, static_cast<int>(LoadCentres(settings_).entries.size()), entry);
        }
        SaveChosenCentre(settings_, c.chosen);
        SaveUseSimDefault(settings_, c.useSim);
        pages_.clear();
        CentrePage& page = Make<CentrePage>();
        Connected(page);
        Settle(page);
        if (c.useSim) {
            // Something the SIM default would change, to see that nothing was sent.
            ASSERT_NE(Card("AT+CSCA=\"+309\"\r").find("OK"), std::string::npos);
            ASSERT_NE(Card("AT+CSMP=71\r").find("OK"), std::string::npos);
        }
        if (c.pull) {
            ASSERT_EQ(sim_->Control("pull"), "OK");
        }

        page.List()->setCurrentItem(page.List()->topLevelItem(c.deleted));
        page.DeleteCentre();
        EXPECT_EQ(page.Busy(), c.pushed);
        if (c.pushed) {
            EXPECT_NE(QApplication::overrideCursor(), nullptr);
        }
        Settle(page);
        EXPECT_EQ(qobject_cast<QCheckBox*>(FindControl(&page, kCentreUseSimId))->isChecked(),
                  c.boxChecked);
        EXPECT_EQ(Int(u"SettingsMessagesUseSIMDefault"), c.boxChecked ? 1 : 0);
        EXPECT_EQ(Int(u"SettingsMessagesChosenCenter"), c.chosenAfter);
        EXPECT_EQ(Column(page.List(), 0, kCentreImageRole), c.marks);
        if (c.centre) {
            EXPECT_NE(Card("AT+CSCA?\r").find(c.centre), std::string::npos) << Card("AT+CSCA?\r");
            EXPECT_NE(Card("AT+CSMP?\r").find(c.csmp), std::string::npos) << Card("AT+CSMP?\r");
        }
    }
}

TEST_P(SettingsPagesTest, ModemPageWritesTheCommandOnSelectionClickAndLeaving) {
    const auto value = [this] { return ReadAll(ModemInitValuePath(files_)); };
    const auto command = [this] {
        char16_t text[64] = u"";
        return GetSettingString(settings_, u"ATModemCmd", text, 64) ? std::u16string(text)
                                                                    : u"<none>";
    };
    // Stored values out of range: speed 9 reads as 9.6, method 7 checks no button.
    SetSettingInt(settings_, u"SettingsModemSpeed", std::array<int32_t, 1>{9}.data());
    SetSettingInt(settings_, u"SettingsModemMethod", std::array<int32_t, 1>{7}.data());
    {
        ModemPage& page = Make<ModemPage>(files_);
        for (int m = 0; m < kModemMethodCount; ++m)
            EXPECT_FALSE(page.Method(m)->isChecked()) << m;
        EXPECT_EQ(page.Speeds()->currentRow(), 0);
        EXPECT_EQ(command(), u"AT+CBST=0,0,1;+CHSN=1,0,0,0");
        EXPECT_FALSE(FindControl(&page, kModemHscsdId)->isEnabled());

        const struct {
            int method, speed;
            const char* download;
            const char* upload;
            const char16_t* command;
        } choices[] = {
            {2, 2, "Download up to 19.2 kbits/s", "Upload up to 19.2 kbits/s",
             u"AT+CBST=51,0,1;+CHSN=3,0,0,0"},
            {1, 4, "Download up to 43.2 kbits/s", "Upload up to 14.4 kbits/s",
             u"AT+CBST=81,0,1;+CHSN=6,0,0,0"},
            {1, 0, "Download up to 9.6 kbits/s", "Upload up to 9.6 kbits/s",
             u"AT+CBST=71,0,1;+CHSN=1,0,0,0"},
        };
        for (const auto& c : choices) {
            page.Method(c.method)->click();
            page.Speeds()->setCurrentRow(c.speed);
            EXPECT_EQ(command(), c.command);
            EXPECT_EQ(value(), QString::fromStdU16String(c.command).toStdString() + "<cr>");
            EXPECT_NE(
                ReadAll(files_.wvdialPath)
                    .find("Init3 = " + QString::fromStdU16String(c.command).toStdString() + "\n"),
                std::string::npos);
            EXPECT_EQ(qobject_cast<QLabel*>(FindControl(&page, kModemDownloadId))->text(),
                      c.download);
            EXPECT_EQ(qobject_cast<QLabel*>(FindControl(&page, kModemUploadId))->text(), c.upload);
            EXPECT_EQ(FindControl(&page, kModemHscsdId)->isEnabled(), c.speed != 0);
            EXPECT_EQ(Int(u"SettingsModemMethod"), c.method);
            EXPECT_EQ(Int(u"SettingsModemSpeed"), c.speed);
        }
        // A click writes at once and leaves the labels as they were.
        page.Method(0)->click();
        EXPECT_EQ(command(), u"AT+CBST=0,0,1;+CHSN=1,0,0,0");
        page.Speeds()->setCurrentRow(3);
        page.Method(2)->click();
        EXPECT_EQ(value(), "AT+CBST=51,0,1;+CHSN=4,0,0,0<cr>");
        // Leaving writes again what the page shows.
        SetSettingString(settings_, u"ATModemCmd", u"changed elsewhere");
    }
    pages_.clear();
    EXPECT_EQ(command(), u"AT+CBST=51,0,1;+CHSN=4,0,0,0");
}

// A stored value of the other type reads as if it were missing, and one out of range as its
// default: the page opens on the first speed, on "Modem" (or no button for a method past the
// three), and writes the command of what it shows.
TEST_P(SettingsPagesTest, ModemPageReadsOtherTypesAndOutOfRangeAsTheFirstChoice) {
    struct Stored {
        const char16_t* text;  // stored as text when set, else as the number; absent when both
        int32_t number;        // are unset (number -99)
    };
    const struct {
        Stored method, speed;
        int checked;  // the method button checked, -1 none
        int row;
        const char16_t* command;
    } cases[] = {
        {{nullptr, 2}, {nullptr, 3}, 2, 3, u"AT+CBST=51,0,1;+CHSN=4,0,0,0"},
        {{nullptr, 2}, {u"3", 0}, 2, 0, u"AT+CBST=39,0,1;+CHSN=1,0,0,0"},
        {{u"2", 0}, {nullptr, 3}, 0, 3, u"AT+CBST=0,0,1;+CHSN=4,0,0,0"},
        {{u"", 0}, {u"4", 0}, 0, 0, u"AT+CBST=0,0,1;+CHSN=1,0,0,0"},
        {{nullptr, -99}, {nullptr, -99}, 0, 0, u"AT+CBST=0,0,1;+CHSN=1,0,0,0"},
        {{nullptr, 1}, {nullptr, -1}, 1, 0, u"AT+CBST=71,0,1;+CHSN=1,0,0,0"},
        {{nullptr, 7}, {nullptr, 5}, -1, 0, u"AT+CBST=0,0,1;+CHSN=1,0,0,0"},
    };
    int n = 0;
    for (const auto& c : cases) {
        SCOPED_TRACE(n);
        SettingsStore store(temp_ / ("modem" + std::to_string(n++) + ".db"));
        ShellContext context{store, link_, dialogs_, temp_ / "run"};
        const auto put = [&store](const char16_t* name, const Stored& value) {
            if (value.text)
                SetSettingString(store, name, value.text);
            else if (value.number != -99)
                SetSettingInt(store, name, &value.number);
        };
        put(u"SettingsModemMethod", c.method);
        put(u"SettingsModemSpeed", c.speed);
        ModemPage page(&host_, context, files_);
        for (int m = 0; m < kModemMethodCount; ++m)
            EXPECT_EQ(page.Method(m)->isChecked(), m == c.checked) << m;
        EXPECT_EQ(page.Speeds()->currentRow(), c.row);
        char16_t command[64] = u"";
        ASSERT_EQ(GetSettingString(store, u"ATModemCmd", command, 64), 1);
        EXPECT_EQ(std::u16string(command), c.command);
        EXPECT_EQ(ReadAll(ModemInitValuePath(files_)),
                  QString::fromStdU16String(c.command).toStdString() + "<cr>");
    }
}

// The Messages page with a setting of the other type: a chosen centre stored as text is no
// choice (nothing marked, nothing sent), "Use SIM Default" stored as text is missing (the SIM's
// own centre is applied when the card connects).
TEST_P(SettingsPagesTest, CentrePageReadsOtherTypesAsMissing) {
    const struct {
        bool useSimAsText, chosenAsText;
        bool boxChecked;
        std::vector<std::u16string> marks;
        const char* cardCentre;
    } cases[] = {
        {false, false, false, {u"1", u"0"}, "+CSCA: \"+306900000\""},
        {false, true, false, {u"0", u"0"}, "+CSCA: \"+301234\""},
        {true, false, true, {u"0", u"0"}, "+CSCA: \"+3097100000\""},
    };
    int n = 0;
    for (const auto& c : cases) {
        SCOPED_TRACE(n);
        ASSERT_NE(Card("AT+CSCA=\"+301234\"\r").find("OK"), std::string::npos);
        SettingsStore store(temp_ / ("centres" + std::to_string(n++) + ".db"));
        ShellContext context{store, link_, dialogs_, temp_ / "run"};
        CentreEntry home;
        home.name = u"Home";
        home.number = u"+306900000";
        SaveCentre(store, 0, home);
        SaveCentre(store, 1, CentreEntry{});
        if (c.useSimAsText)
            SetSettingString(store, u"SettingsMessagesUseSIMDefault", u"0");
        else
            SaveUseSimDefault(store, false);
        if (c.chosenAsText)
            SetSettingString(store, u"SettingsMessagesChosenCenter", u"0");
        else
            SaveChosenCentre(store, 0);
        CentrePage page(&host_, context);
        Connected(page);
        Settle(page);
        EXPECT_EQ(qobject_cast<QCheckBox*>(FindControl(&page, kCentreUseSimId))->isChecked(),
                  c.boxChecked);
        EXPECT_EQ(Column(page.List(), 0, kCentreImageRole), c.marks);
        EXPECT_NE(Card("AT+CSCA?\r").find(c.cardCentre), std::string::npos);
    }
}

// Every page of the view as a person sees it on the narrow window, with a search listed and a
// centre chosen, for a look at the layout.
TEST_P(SettingsPagesTest, ScreenshotOfEveryPage) {
    const std::string folder = VQM_SCREENSHOT_DIR;
    std::filesystem::create_directories(folder);
    CentreEntry home;
    home.name = u"Home";
    home.number = u"+306900000";
    SaveCentre(settings_, 0, home);
    SaveCentre(settings_, 1, CentreEntry{});
    SaveChosenCentre(settings_, 0);
    SaveUseSimDefault(settings_, false);
    SettingsView view(&host_, context_);
    view.SetCardStateSource([] { return 2; });
    view.OnMessage(kMsgCardStateChanged, 0, 0);
    auto* network = dynamic_cast<NetworkPage*>(view.Page(kSettingsNetwork));
    auto* centres = dynamic_cast<CentrePage*>(view.Page(kSettingsMessages));
    ASSERT_TRUE(WaitFor([&] { return !network->Busy() && !centres->Busy(); }));
    network->ManualButton()->click();
    network->Search();
    ASSERT_TRUE(WaitFor([&] { return !network->Busy(); }));
    host_.show();
    auto* tabs = qobject_cast<QTabBar*>(FindControl(&view, kSettingsTabId));
    const std::string dialect = GetParam() == Dialect::Card ? "card" : "standard";
    for (int i = 0; i < kSettingsPageCount; ++i) {
        tabs->setCurrentIndex(i);
        QApplication::processEvents();
        const std::string name = tabs->tabText(i).toLower().replace(' ', '-').toStdString();
        // Every button the page shows lies whole above the view's tab strip.
        for (QAbstractButton* button : view.Page(i)->findChildren<QAbstractButton*>()) {
            if (!button->isVisible()) continue;
            const QRect shown(button->mapTo(&view, QPoint(0, 0)), button->size());
            EXPECT_LE(shown.bottom(), tabs->y()) << name << ": " << button->text().toStdString();
        }
        EXPECT_TRUE(view.grab().save(
            QString::fromStdString(folder + "/settings-" + name + "-" + dialect + ".png")));
    }
}

}  // namespace
}  // namespace vqm
