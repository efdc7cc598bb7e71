#include "cardsim/phonebooks.h"

#include <cstdio>
#include <cstdlib>
#include <ostream>
#include <sstream>
#include <vector>

#include "cardsim/arguments.h"
#include "cardsim/card_engine.h"
#include "support/gsm.h"
#include "support/text.h"

namespace vqm::cardsim {

namespace {

// One parameter of an extended command: quoted strings may hold commas.
struct Field {
    std::string value;
    bool quoted = false;
};

// The card's one argument splitter (cardsim/arguments.h); false for an unclosed quote.
bool SplitFields(const std::string& text, std::vector<Field>& fields) {
    std::vector<Argument> arguments;
    const bool ok = SplitArguments(text, &arguments);
    fields.clear();
    for (const Argument& argument : arguments)
        fields.push_back({argument.text, argument.quoted});
    return ok;
}

bool WholeNumber(const std::string& text, int* value) {
    if (text.empty() || text.size() > 9 ||
        text.find_first_not_of("0123456789") != std::string::npos)
        return false;
    *value = std::atoi(text.c_str());
    return true;
}

// Digits, '*' and '#', with one '+' in front: what a phonebook number may hold.
bool DialableNumber(const std::string& number) {
    const size_t start = !number.empty() && number[0] == '+' ? 1 : 0;
    return number.size() > start &&
           number.find_first_not_of("0123456789*#", start) == std::string::npos;
}

std::string Utf8ToLatin(const std::string& text) {
    std::string latin;
    for (char16_t unit : Utf8ToUtf16(text))
        latin.push_back(LatinOrQuestionMark(unit));
    return latin;
}

std::string LatinToUtf8(const std::string& text) {
    std::u16string wide;
    for (char c : text)
        wide.push_back(LatinToWide(c));
    return Utf16ToUtf8(wide);
}

std::string EntryLine(int index, const std::string& number, int type, const std::string& text) {
    return "\r\n+CPBR: " + std::to_string(index) + ",\"" + number + "\"," + std::to_string(type) +
           ",\"" + text + "\"\r\n";
}

// Demo contacts: numbers from the ranges set aside for drama, so no real subscriber is rung.
struct DemoContact {
    const char* number;
    const char* name;  // ISO 8859-1
};
constexpr DemoContact kDemoSim[] = {
    {"+447700900123", "Alice Smith"}, {"+447700900456", "Bob Jones"},
    {"01632960001", "Home"},          {"+447700900789", "Chlo\xE9 Martin"},
    {"02079460123", "Office"},        {"+447700900321", "David Brown"},
    {"+447700900654", "Emma Wilson"}, {"01632960555", "Dentist"},
};
constexpr DemoContact kDemoCard[] = {
    {"+447700900111", "Mum"},
    {"+447700900222", "Work mobile"},
    {"01632960999", "Garage"},
};

}  // namespace

Phonebooks::Phonebooks() {
    // Limits as a common SIM and a small card memory report them; both fit the dialer's
    // 32-byte number and name fields.
    books_[0] = Book{"SM", 250, 20, 18, {}};
    books_[1] = Book{"ME", 100, 30, 30, {}};
}

const Phonebooks::Book* Phonebooks::Find(const std::string& storage) const {
    for (const Book& book : books_)
        if (book.name == storage) return &book;
    return nullptr;
}

Phonebooks::Book* Phonebooks::FindBook(const std::string& storage) {
    return const_cast<Book*>(static_cast<const Phonebooks*>(this)->Find(storage));
}

const std::string& Phonebooks::Charset() const {
    static const std::string kLatin = "8859-1";
    return engine_ ? engine_->Charset() : kLatin;
}

std::string Phonebooks::TextToLine(const std::string& latin) const {
    if (Charset() == "8859-1") return latin;
    std::string line;
    for (char c : latin) {
        const auto byte = static_cast<uint8_t>(c);
        if (Charset() == "UCS2") {
            char hex[5];
            IntToHex(byte, hex, sizeof hex, 4);
            line += hex;
        } else if (Charset() == "GSM") {
            const int code = LatinToGsmCode(byte);
            line.push_back(code < 0 ? '?' : static_cast<char>(code));
        } else {
            line.push_back(byte < 0x80 ? c : '?');
        }
    }
    return line;
}

bool Phonebooks::TextFromLine(const std::string& line, std::string& latin) const {
    latin.clear();
    if (Charset() == "UCS2") {
        if (line.size() % 4) return false;
        for (size_t i = 0; i < line.size(); i += 4) {
            const int unit = HexToInt(line.data() + i, line.data() + line.size(), 4);
            if (unit < 0) return false;
            latin.push_back(LatinOrQuestionMark(static_cast<char16_t>(unit)));
        }
        return true;
    }
    for (char c : line) {
        const auto byte = static_cast<uint8_t>(c);
        if (Charset() == "GSM") {
            if (byte > 0x7F) return false;
            const int latinByte = GsmCodeToLatin(byte);
            latin.push_back(latinByte < 0 ? '?' : static_cast<char>(latinByte));
        } else if (Charset() == "IRA" && byte > 0x7F) {
            return false;
        } else {
            latin.push_back(c);
        }
    }
    return true;
}

void Phonebooks::Changed() {
    if (engine_) engine_->MarkChanged();
}

std::string Phonebooks::Put(Book& book, int index, const std::string& number, int type,
                            const std::string& text) {
    if (index < 1 || index > book.total) return "index out of range";
    if (!DialableNumber(number)) return "not a phone number";
    const bool international = number[0] == '+';
    if (static_cast<int>(number.size()) - (international ? 1 : 0) > book.numberLength)
        return "number too long";
    if (static_cast<int>(text.size()) > book.textLength) return "name too long";
    if (text.find('"') != std::string::npos) return "name holds a quote";
    // A '+' decides the type, as the SIM stores the number's kind apart from its digits.
    book.entries[index] = Entry{number, international ? 145 : type, text};
    Changed();
    return {};
}

Handled Phonebooks::Run(const std::string& upper, const std::string& original, std::string& info,
                        std::string& errorText) {
    auto line = [&](const std::string& text) { info += "\r\n" + text + "\r\n"; };
    Book& book = books_[selected_];
    // The dialer never turns on +CMEE, so failures are the plain ERROR a card sends then.
    errorText = "ERROR";
    if (upper == "+CPBS=?") {
        line("+CPBS: (\"SM\",\"ME\")");
        return Handled::Ok;
    }
    if (upper == "+CPBS?") {
        line("+CPBS: \"" + book.name + "\"," + std::to_string(book.entries.size()) + "," +
             std::to_string(book.total));
        return Handled::Ok;
    }
    if (upper.rfind("+CPBS=", 0) == 0) {
        std::vector<Field> fields;
        if (!SplitFields(upper.substr(6), fields) || fields.size() != 1) return Handled::Error;
        for (int i = 0; i < 2; ++i) {
            if (books_[i].name == fields[0].value) {
                selected_ = i;
                return Handled::Ok;
            }
        }
        return Handled::Error;
    }
    if (upper == "+CPBR=?") {
        line("+CPBR: (1-" + std::to_string(book.total) + ")," + std::to_string(book.numberLength) +
             "," + std::to_string(book.textLength));
        return Handled::Ok;
    }
    if (upper.rfind("+CPBR=", 0) == 0) return Read(upper.substr(6), info);
    if (upper == "+CPBW=?") {
        line("+CPBW: (1-" + std::to_string(book.total) + ")," + std::to_string(book.numberLength) +
             ",(129,145)," + std::to_string(book.textLength));
        return Handled::Ok;
    }
    // Names keep their case: the parameters come from the line as typed.
    if (upper.rfind("+CPBW=", 0) == 0) return Write(original.substr(6));
    return Handled::No;
}

Handled Phonebooks::Read(const std::string& parameters, std::string& info) {
    const Book& book = books_[selected_];
    std::vector<Field> fields;
    int first = 0, last = 0;
    if (!SplitFields(parameters, fields) || fields.empty() || fields.size() > 2 ||
        !WholeNumber(fields[0].value, &first))
        return Handled::Error;
    last = first;
    if (fields.size() == 2 && !WholeNumber(fields[1].value, &last)) return Handled::Error;
    if (first < 1 || first > book.total || last < first || last > book.total) return Handled::Error;
    // Empty places are simply not listed; a range with nothing in it answers OK alone.
    for (auto it = book.entries.lower_bound(first); it != book.entries.end() && it->first <= last;
         ++it)
        info +=
            EntryLine(it->first, it->second.number, it->second.type, TextToLine(it->second.text));
    return Handled::Ok;
}

Handled Phonebooks::Write(const std::string& parameters) {
    Book& book = books_[selected_];
    std::vector<Field> fields;
    if (!SplitFields(parameters, fields) || fields.size() > 4) return Handled::Error;
    int index = 0;
    if (fields[0].quoted) return Handled::Error;
    if (!fields[0].value.empty() && !WholeNumber(fields[0].value, &index)) return Handled::Error;
    if (fields.size() == 1) {
        // Only an index: delete that place. An empty place deletes without complaint.
        if (index < 1 || index > book.total) return Handled::Error;
        if (book.entries.erase(index)) Changed();
        return Handled::Ok;
    }
    if (!fields[1].quoted) return Handled::Error;
    // Numbers go out as plain digits in every character set; one that comes in encoded
    // (UCS2 hex) is taken back to its digits.
    std::string number;
    if (!(Charset() == "UCS2" && TextFromLine(fields[1].value, number) && DialableNumber(number)))
        number = fields[1].value;
    int type = !number.empty() && number[0] == '+' ? 145 : 129;
    if (fields.size() >= 3 && !fields[2].value.empty()) {
        if (fields[2].quoted || !WholeNumber(fields[2].value, &type) || type < 128 || type > 255)
            return Handled::Error;
    }
    std::string text;
    if (fields.size() == 4) {
        if (!fields[3].quoted && !fields[3].value.empty()) return Handled::Error;
        if (!TextFromLine(fields[3].value, text)) return Handled::Error;
    }
    if (fields[0].value.empty()) {
        // No index: the first free place. A full book is the card's "memory full".
        index = 0;
        for (int i = 1; i <= book.total && index == 0; ++i)
            if (!book.entries.count(i)) index = i;
        if (index == 0) return Handled::Error;
    }
    return Put(book, index, number, type, text).empty() ? Handled::Ok : Handled::Error;
}

std::string Phonebooks::Control(const std::string& command, const std::string& rest) {
    if (command != "phonebook-add" && command != "phonebook-clear" && command != "phonebook-fill")
        return {};
    std::istringstream words(rest);
    std::string storage;
    words >> storage;
    Book* book = FindBook(storage);
    if (!book) return "ERROR: which phonebook? SM or ME";
    if (command == "phonebook-clear") {
        book->entries.clear();
        Changed();
        return "OK";
    }
    if (command == "phonebook-fill") {
        std::string countText;
        words >> countText;
        int count = 0;
        if (!WholeNumber(countText, &count) || count > book->total)
            return "ERROR: how many? 0 to " + std::to_string(book->total);
        book->entries.clear();
        for (int i = 1; i <= count; ++i) {
            char number[24], name[24];
            std::snprintf(number, sizeof number, "+4477009%05d", i);
            std::snprintf(name, sizeof name, "Contact %03d", i);
            book->entries[i] = Entry{number, 145, name};
        }
        Changed();
        return "OK";
    }
    std::string number;
    words >> number;
    std::string name;
    std::getline(words >> std::ws, name);
    int index = 0;
    for (int i = 1; i <= book->total && index == 0; ++i)
        if (!book->entries.count(i)) index = i;
    if (index == 0) return "ERROR: phonebook full";
    const std::string failure =
        Put(*book, index, number, number.rfind('+', 0) == 0 ? 145 : 129, Utf8ToLatin(name));
    return failure.empty() ? "OK" : "ERROR: " + failure;
}

std::string Phonebooks::ControlHelp() const {
    return "  phonebook-add SM|ME NUMBER NAME...   a contact in the first free place\n"
           "  phonebook-clear SM|ME    empties that phonebook\n"
           "  phonebook-fill SM|ME N   replaces it with N generated contacts, places 1..N\n";
}

// "pb SM 3 129 +447700900123 Name with spaces", the name in UTF-8 so the file reads well.
void Phonebooks::Save(std::ostream& out) const {
    for (const Book& book : books_)
        for (const auto& [index, entry] : book.entries)
            out << "pb " << book.name << ' ' << index << ' ' << entry.type << ' ' << entry.number
                << ' ' << LatinToUtf8(entry.text) << '\n';
}

bool Phonebooks::Load(const std::string& name, const std::string& rest) {
    if (name != "pb") return false;
    std::istringstream words(rest);
    std::string storage, number, text;
    int index = 0, type = 0;
    words >> storage >> index >> type >> number;
    std::getline(words >> std::ws, text);
    // A damaged line costs only its own entry.
    if (Book* book = FindBook(storage)) Put(*book, index, number, type, Utf8ToLatin(text));
    return true;
}

void Phonebooks::FillDemo() {
    int index = 1;
    for (const DemoContact& contact : kDemoSim)
        Put(books_[0], index++, contact.number, 129, contact.name);
    index = 1;
    for (const DemoContact& contact : kDemoCard)
        Put(books_[1], index++, contact.number, 129, contact.name);
}

}  // namespace vqm::cardsim
