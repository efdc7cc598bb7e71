// The simulated card's phonebooks: the SIM's ("SM", 250 places) and the card's own memory ("ME",
// 100 places), each with the field limits a real card reports. Answers +CPBS, +CPBR and +CPBW
// as 27.007 describes them; names are kept in ISO 8859-1, the character set the dialer selects.
#pragma once

#include <map>
#include <string>

#include "cardsim/command_set.h"

namespace vqm::cardsim {

class Phonebooks : public CommandSet {
  public:
    struct Entry {
        std::string number;  // as written, with its '+' when international
        int type = 129;
        std::string text;  // ISO 8859-1
    };
    struct Book {
        std::string name;  // "SM" or "ME"
        int total;         // places 1..total
        int numberLength;  // longest number in digits, a leading '+' not counted
        int textLength;    // longest name in bytes
        std::map<int, Entry> entries;
    };

    Phonebooks();

    Handled Run(const std::string& upper, const std::string& original, std::string& info,
                std::string& errorText) override;
    std::string Control(const std::string& command, const std::string& rest) override;
    std::string ControlHelp() const override;
    void Save(std::ostream& out) const override;
    bool Load(const std::string& name, const std::string& rest) override;
    void FillDemo() override;

    // nullptr for a storage this card does not have.
    const Book* Find(const std::string& storage) const;

    // The character set of names on the line, as the client chose it with AT+CSCS (the
    // engine keeps it). Names are kept in ISO 8859-1 whatever the line uses.
    const std::string& Charset() const;

  private:
    Book* FindBook(const std::string& storage);
    Handled Write(const std::string& parameters);
    Handled Read(const std::string& parameters, std::string& info);
    // Stores an entry after checking it against the book's limits; "" or the reason it failed.
    std::string Put(Book& book, int index, const std::string& number, int type,
                    const std::string& text);
    void Changed();
    std::string TextToLine(const std::string& latin) const;
    // The name or number as it came on the line back into ISO 8859-1; false when it is not
    // valid in the current character set.
    bool TextFromLine(const std::string& line, std::string& latin) const;

    Book books_[2];
    int selected_ = 0;  // index into books_; the SIM after power-up, as on a real card
};

}  // namespace vqm::cardsim
