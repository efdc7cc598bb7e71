// The Write SMS view's logic: the counter, the recipient parse, the length question, the send to
// each recipient against the simulated card (both personalities) with the sent copies filed, the
// draft, and what a request from another view does to the fields.
#include "messaging/write_sms.h"

#include <gtest/gtest.h>

#include <cstring>
#include <memory>
#include <string>
#include <vector>

#include "cardsim/card_sim.h"
#include "link/link.h"
#include "messaging/sms_folder.h"
#include "support/settings_store.h"
#include "support/text.h"
#include "tests/common/temp_folder.h"

namespace vqm {
namespace {

std::u16string U(const std::string& utf8) {
    return Utf8ToUtf16(utf8);
}
std::u16string Repeat(const std::u16string& unit, int times) {
    std::u16string text;
    for (int i = 0; i < times; ++i)
        text += unit;
    return text;
}

TEST(WriteSmsCounter, CountsAlphabetAndMessages) {
    struct Case {
        std::u16string text;
        int coding;
        std::string shown;
    } cases[] = {
        {u"", kCodingGsm, "0/160"},
        {Repeat(u"a", 160), kCodingGsm, "160/160"},
        {Repeat(u"a", 161), kCodingGsm, "161/160 (2 SMS)"},
        {Repeat(u"a", 306), kCodingGsm, "306/160 (2 SMS)"},
        {Repeat(u"a", 307), kCodingGsm, "307/160 (3 SMS)"},
        {u"line\r\nbreak", kCodingGsm, "10/160"},  // the edit box's "\r\n" travels as one
        {U("Καλημέρα"), kCodingUcs2, "8/70"},
        {Repeat(U("λ"), 70), kCodingUcs2, "70/70"},
        {Repeat(U("λ"), 71), kCodingUcs2, "71/70 (2 SMS)"},
        {Repeat(U("λ"), 135), kCodingUcs2, "135/70 (3 SMS)"},
        {u"a[b", kCodingUcs2, "3/70"},  // the extension table is not sent as 7-bit
        // The alphabet is that of the part a send reads; the messages are the whole text's.
        {Repeat(u"a", 170) + U("λ"), kCodingGsm, "171/160 (3 SMS)"},
    };
    for (const Case& c : cases) {
        SCOPED_TRACE(Utf16ToUtf8(c.text.substr(0, 20)) + " (" + std::to_string(c.text.size()) +
                     ")");
        const MessageCount count = CountMessage(c.text);
        EXPECT_EQ(count.coding, c.coding);
        EXPECT_EQ(Utf16ToUtf8(CounterText(count)), c.shown);
    }
}

TEST(WriteSmsRecipients, ParseFilterAndDisplay) {
    std::u16string many;  // 60 entries, 360 characters: only the first 256 are read
    for (int i = 0; i < 60; ++i)
        many += u"12345;";
    struct Case {
        std::u16string field;
        std::vector<std::string> numbers;
        std::u16string display;
    } cases[] = {
        {u"Ann<+44 (20) 1234 5678>", {"+44+2012345678"}, u"Ann<+44+2012345678>;\r\n"},
        {u" 12345 ;\r\n+44 20-1234", {"12345", "+44201234"}, u"12345;\r\n+44201234;\r\n"},
        {u"Bob Jones<+447700900456>;\r\n", {"+447700900456"}, u"Bob Jones<+447700900456>;\r\n"},
        {u"abc", {}, u""},  // letters only: skipped, not counted
        {u"abc;12345", {"12345"}, u"12345;\r\n"},
        {u";; ;\r\n", {}, u""},
        {u"Bob<1-2-3", {"123"}, u"Bob<123>;\r\n"},  // no '>': the number runs to the end
        {u"Ann<>", {""}, u"Ann<>;\r\n"},            // counted; the send refuses it
        {u"Ann<1>>;<<2>x9", {"1", "29"}, u"Ann<1>;\r\n<29>;\r\n"},
        {u"*100#", {"*100#"}, u"*100#;\r\n"},
        {many, std::vector<std::string>(42, "12345"), {}},
    };
    cases[10].numbers.push_back("1234");  // the entry cut at character 256
    for (const Case& c : cases) {
        SCOPED_TRACE(Utf16ToUtf8(c.field.substr(0, 40)));
        const ParsedRecipients parsed = ParseRecipients(c.field);
        EXPECT_EQ(parsed.numbers, c.numbers);
        EXPECT_EQ(parsed.count, static_cast<int>(c.numbers.size()));
        if (!c.display.empty() || c.numbers.empty()) {
            EXPECT_EQ(parsed.display, c.display);
        }
    }
}

// Entries "Pal<i><+4477009000<i>>;" of 22 characters with the field's own "\n" behind each.
std::u16string Entries(int count) {
    std::u16string field;
    for (int i = 10; i < 10 + count; ++i)
        field += U("Pal" + std::to_string(i) + "<+4477009000" + std::to_string(i) + ">;\n");
    return field;
}

TEST(WriteSmsRecipients, TheEntryTheReadLimitCutsIsNamed) {
    const std::u16string ten = Entries(10);  // 10 x 22 characters
    ASSERT_EQ(ten.size(), 220u);
    const std::u16string upTo256 = ten + std::u16string(35, u' ') + u"7";  // "7" is the 256th
    ASSERT_EQ(upTo256.size(), 256u);
    struct Case {
        const char* what;
        std::u16string field;
        std::u16string named;
    } cases[] = {
        {"within the limit", ten, u""},
        {"an entry ending on the 256th character", upTo256, u""},
        {"and only blanks and separators behind it", upTo256 + u";\n ;;  \n", u""},
        {"one entry behind it, left out", upTo256 + u";Bob<+44 1>", u"Bob<+44 1>"},
        {"an entry across the limit", ten + std::u16string(30, u' ') + u"Ann<+447700900999>;7",
         u"Ann<+447700900999>"},
        {"twelve entries", Entries(12), u"Pal21<+447700900021>"},
        {"a bare number across the limit", std::u16string(250, u';') + u"0123456789",
         u"0123456789"},
        {"letters only across the limit", std::u16string(250, u' ') + u"abcdefghij", u"abcdefghij"},
    };
    for (const Case& c : cases) {
        SCOPED_TRACE(c.what);
        EXPECT_EQ(OverlongRecipient(c.field), c.named);
    }
    // The box names the entry, shortened when it is long.
    EXPECT_EQ(RecipientsTooLongText(u"Bob<+44 1>"),
              u"Too many recipients: only the first 256 characters are read, and \"Bob<+44 1>\" "
              u"does not fit in them. Please remove some recipients. Nothing has been sent.");
    const std::u16string longName = std::u16string(60, u'n') + u"<1>";
    EXPECT_NE(RecipientsTooLongText(longName).find(std::u16string(40, u'n') + u"...\""),
              std::u16string::npos);
}

TEST(WriteSmsLength, AsksAndCutsAtTheLimitOfItsAlphabet) {
    struct Case {
        std::u16string text;
        int coding;
        bool ask;
        size_t cut;
        const char16_t* question;
    } cases[] = {
        {Repeat(u"a", 160), kCodingGsm, false, 160, u""},
        {Repeat(u"a", 161), kCodingGsm, true, 160, kLengthGsmQuestion},
        {Repeat(U("λ"), 70), kCodingUcs2, false, 70, u""},
        {Repeat(U("λ"), 71), kCodingUcs2, true, 70, kLengthUcs2Question},
    };
    for (const Case& c : cases) {
        SCOPED_TRACE(c.text.size());
        const LengthCheck check = CheckLength(c.text, c.coding);
        EXPECT_EQ(check.ask, c.ask);
        EXPECT_EQ(check.cut, c.cut);
        EXPECT_EQ(check.question, c.question);
    }
}

TEST(WriteSmsPrepare, ReadsTheFieldsAsksAndBuildsTheBody) {
    std::vector<std::u16string> asked;
    auto answer = [&asked](bool ok) {
        return [&asked, ok](const std::u16string& question) {
            asked.push_back(question);
            return ok;
        };
    };
    PreparedSend prepared;
    // Nothing to send: no question, nothing built.
    EXPECT_FALSE(PrepareSend(u"", u"Hello", answer(true), &prepared));
    EXPECT_FALSE(PrepareSend(u"12345", u"", answer(true), &prepared));
    EXPECT_TRUE(asked.empty());

    ASSERT_TRUE(PrepareSend(u"12345", Repeat(u"a", 160), answer(false), &prepared));
    EXPECT_TRUE(asked.empty());  // exactly 160: no question
    EXPECT_EQ(prepared.body.coding, 0);
    EXPECT_EQ(prepared.body.length, 160);

    EXPECT_FALSE(PrepareSend(u"12345", Repeat(u"a", 161), answer(false), &prepared));
    ASSERT_EQ(asked.size(), 1u);  // Cancel abandons
    ASSERT_TRUE(PrepareSend(u"12345", Repeat(u"b", 200), answer(true), &prepared));
    EXPECT_EQ(asked.back(), kLengthGsmQuestion);
    EXPECT_EQ(prepared.body.length, 160);
    EXPECT_EQ(std::string(prepared.body.text), std::string(160, 'b'));

    const std::u16string greek = U("Γειά σου κόσμε");
    ASSERT_TRUE(PrepareSend(u"Ann<+30 210 1234567>", greek, answer(true), &prepared));
    EXPECT_EQ(prepared.body.coding, 8);
    EXPECT_EQ(prepared.body.length, static_cast<int>(greek.size() * 4));
    EXPECT_EQ(prepared.recipients.numbers, std::vector<std::string>{"+302101234567"});
    EXPECT_TRUE(prepared.refusal.empty());

    // Recipients running past what is read: refused before any question, naming the entry the
    // limit cuts, with nothing parsed to send to; with no text, nothing at all as before.
    asked.clear();
    const std::u16string overlong = Entries(12);
    EXPECT_FALSE(PrepareSend(overlong, Repeat(u"a", 161), answer(true), &prepared));
    EXPECT_TRUE(asked.empty());
    EXPECT_EQ(prepared.refusal, RecipientsTooLongText(u"Pal21<+447700900021>"));
    EXPECT_TRUE(prepared.recipients.numbers.empty());
    EXPECT_FALSE(PrepareSend(overlong, u"", answer(true), &prepared));
    EXPECT_TRUE(prepared.refusal.empty());
    // The same entries, one fewer so that all fit, go out.
    ASSERT_TRUE(PrepareSend(Entries(11), u"Hi", answer(true), &prepared));
    EXPECT_EQ(prepared.recipients.count, 11);
    EXPECT_EQ(prepared.recipients.numbers.back(), "+447700900020");
}

TEST(WriteSmsRequests, ReplyForwardAndAddedRecipients) {
    struct Case {
        WriteFields before;
        WriteRequest request;
        WriteFields after;
    } cases[] = {
        {{u"1;", u"typed"},
         ReplyRequest(u"Alice<+447700900123>;\r\n"),
         {u"Alice<+447700900123>;\r\n", u""}},
        {{u"1;", u"typed"}, ForwardRequest(u"Hi"), {u"", u"Hi"}},
        {{u"", u"typed"}, AddRecipientsRequest(u"A<1>;\r\n"), {u"A<1>;\r\n", u"typed"}},
        {{u"B<2>;\r\n", u"t"}, AddRecipientsRequest(u"A<1>;\r\n"), {u"B<2>;\r\nA<1>;\r\n", u"t"}},
        {{u"555 ", u"t"}, AddRecipientsRequest(u"A<1>;\r\n"), {u"555 ;\r\nA<1>;\r\n", u"t"}},
        {{u"B<2>;", u"t"}, AddRecipientsRequest(u""), {u"B<2>;", u"t"}},  // nothing ticked
    };
    for (const Case& c : cases) {
        WriteFields fields = c.before;
        ApplyWriteRequest(c.request, &fields);
        EXPECT_EQ(fields.recipients, c.after.recipients);
        EXPECT_EQ(fields.text, c.after.text);
    }
    // Requests that wait for the view: a fresh one replaces, added recipients join; taken once.
    WriteHandoff handoff;
    handoff.Hand(AddRecipientsRequest(u"A<1>;\r\n"));
    handoff.Hand(ReplyRequest(u"B<2>;\r\n"));
    handoff.Hand(AddRecipientsRequest(u"C<3>;\r\n"));
    const std::optional<WriteRequest> taken = handoff.Take();
    ASSERT_TRUE(taken.has_value());
    EXPECT_EQ(taken->recipients, u"B<2>;\r\nC<3>;\r\n");
    EXPECT_TRUE(taken->fresh);
    EXPECT_FALSE(handoff.Take().has_value());
}

// The send and the filing against the simulated card, on both its personalities.
class WriteSmsSendTest : public ::testing::TestWithParam<cardsim::Dialect> {
  protected:
    WriteSmsSendTest() {
        SetSettingString(settings_, u"InstallPath", Utf8ToUtf16(install_).c_str());
        std::filesystem::create_directories(install_);
        cardsim::SimConfig config;
        config.baud = 0;
        config.stateFile = temp_ / "card.state";
        config.engine.dialect = GetParam();
        sim_ = std::make_unique<cardsim::CardSim>(config);
        if (sim_->PowerUp()) opened_ = PortOpenDevice(link_, sim_->DevicePath().c_str());
        StoreGuardCreate(store_);
        // Filed as the SMS Folder files them: into the page the store names.
        store_.hooks.pasteInto = [this](int page) {
            PasteIntoPage(store_, link_, page, FolderUi{});
            ++pastes_;
        };
    }
    ~WriteSmsSendTest() override { PortClose(link_); }
    void SetUp() override { ASSERT_EQ(opened_, 1); }

    // Sends "Hello" to the field; every message the card took is filed as sent.
    SendOutcome Send(const std::u16string& field, const std::function<void(int)>& before = {}) {
        PreparedSend prepared;
        if (!PrepareSend(field, u"Hello", {}, &prepared)) return {};
        SendHooks hooks;
        hooks.attempt = [&](int place, const std::string& number) {
            attempts_.push_back(number);
            if (before) before(place);
        };
        hooks.sent = [this](const SmsRecord& record) { ClipboardCopyRecord(store_, record); };
        return SendToRecipients(link_, prepared.body, prepared.recipients, hooks);
    }
    std::vector<SmsRecord> Local() {
        std::vector<SmsRecord> records;
        StoreReadAll(store_, kFolderLocal, &records);
        return records;
    }

    const testing::TempFolder temp_;
    const std::string install_ = temp_ / "install/";
    SettingsStore settings_{temp_ / "settings.db"};
    Link link_{settings_, DriverRoots{temp_ / "run", temp_ / "tty"}};
    std::unique_ptr<cardsim::CardSim> sim_;
    MessageStore store_{settings_};
    std::vector<std::string> attempts_;
    int opened_ = 0;
    int pastes_ = 0;
};

TEST_P(WriteSmsSendTest, EachRecipientInTurnUntilTheFirstFailure) {
    struct Case {
        std::u16string field;
        SendEnd end;
        int sent;
        std::string failed;
        std::vector<std::string> attempts;
    } cases[] = {
        {u"12345;Bob<+447700900456>", SendEnd::Sent, 2, "", {"12345", "+447700900456"}},
        // The card refuses the second ('(' made a second '+'); the third is not tried.
        {u"12345;Ann<+44 (20) 1234 5678>;777",
         SendEnd::Failed,
         1,
         "+44+2012345678",
         {"12345", "+44+2012345678"}},
        {u"Ann<>;12345", SendEnd::Rejected, 0, "", {}},  // an empty number ends the walk
        {u"abc", SendEnd::Nothing, 0, "", {}},           // no entry counted
        // A name with letters for its number: the walk ends there without a word, as every
        // rejected recipient ends it; the one before is sent and filed, the one after not tried.
        {u"12345;Bob<abc>;777", SendEnd::Rejected, 1, "", {"12345"}},
        // More recipients than a send reads: no one at all, rather than a cut number.
        {Entries(12), SendEnd::Nothing, 0, "", {}},
    };
    size_t filed = 0;
    for (const Case& c : cases) {
        SCOPED_TRACE(Utf16ToUtf8(c.field));
        attempts_.clear();
        const SendOutcome outcome = Send(c.field);
        EXPECT_EQ(outcome.end, c.end);
        EXPECT_EQ(outcome.sent, c.sent);
        EXPECT_EQ(outcome.failedNumber, c.failed);
        EXPECT_EQ(attempts_, c.attempts);
        filed += static_cast<size_t>(c.sent);
        // Every message the card took is on the Sent page, once, with its number and time.
        const std::vector<SmsRecord> local = Local();
        ASSERT_EQ(local.size(), filed);
        for (size_t i = filed - static_cast<size_t>(c.sent); i < filed; ++i) {
            EXPECT_STREQ(local[i].status, "STO SENT");
            EXPECT_EQ(local[i].number, c.attempts[i - (filed - static_cast<size_t>(c.sent))]);
            EXPECT_EQ(std::strlen(local[i].date), 19u) << local[i].date;
            EXPECT_EQ(std::string(local[i].text, static_cast<size_t>(local[i].length)), "Hello");
        }
    }
    EXPECT_EQ(ClipboardCount(store_), 0);  // the transfer file is gone once filed

    const SendBox failed = SendEndBox({SendEnd::Failed, 1, "+44+2012345678"});
    EXPECT_EQ(failed.text,
              u"Cannot send message to \"+44+2012345678\". Please check the SMSC setting or try "
              u"again later.");
    EXPECT_EQ(failed.title, u"Error");
    EXPECT_EQ(SendEndBox({SendEnd::Sent, 2, ""}).text, u"Message has been sent.");
    EXPECT_TRUE(SendEndBox({SendEnd::Rejected, 1, ""}).text.empty());
}

TEST_P(WriteSmsSendTest, ACardPulledMidSendNamesTheRecipientItFailedOn) {
    const SendOutcome outcome = Send(u"12345;+447700900456;777", [this](int place) {
        if (place == 1) sim_->Control("pull");
    });
    EXPECT_EQ(outcome.end, SendEnd::Failed);
    EXPECT_EQ(outcome.failedNumber, "+447700900456");
    EXPECT_EQ(attempts_.size(), 2u);
    const std::vector<SmsRecord> local = Local();
    ASSERT_EQ(local.size(), 1u);  // the one before, filed once
    EXPECT_STREQ(local[0].number, "12345");
    EXPECT_EQ(pastes_, 1);

    // With no card at all the format cannot be set and nothing is tried.
    attempts_.clear();
    EXPECT_EQ(Send(u"12345").end, SendEnd::FormatFailed);
    EXPECT_TRUE(attempts_.empty());
    EXPECT_EQ(SendEndBox({SendEnd::FormatFailed, 0, ""}).text, u"Failed to send message.");
}

TEST_P(WriteSmsSendTest, ADraftNeedsNoCardAndKeepsNoNumber) {
    PortClose(link_);
    EXPECT_EQ(SaveDraft(store_, u""), 0);
    EXPECT_EQ(pastes_, 0);
    const std::u16string greek = U("Καλημέρα");
    ASSERT_EQ(SaveDraft(store_, Repeat(u"d", 300)), 1);
    ASSERT_EQ(SaveDraft(store_, greek), 1);
    const std::vector<SmsRecord> local = Local();
    ASSERT_EQ(local.size(), 2u);
    EXPECT_STREQ(local[0].status, "PDA DRAFT");
    EXPECT_STREQ(local[0].number, "");
    EXPECT_EQ(local[0].length, 256);  // a draft keeps up to 256 characters
    EXPECT_EQ(local[1].coding, 8);
    EXPECT_EQ(MessageBodyText(local[1]), greek);
}

INSTANTIATE_TEST_SUITE_P(BothPersonalities, WriteSmsSendTest,
                         ::testing::Values(cardsim::Dialect::Card, cardsim::Dialect::Standard),
                         [](const auto& info) {
                             return info.param == cardsim::Dialect::Card ? "Card" : "Standard";
                         });

}  // namespace
}  // namespace vqm
