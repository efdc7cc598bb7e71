// The one way every part of the simulated card reads the parameters of an AT command line:
// commands chained with ';' and the fields of one command split at ','. A quoted field may hold
// ',' and ';'; quotes open only at the start of a field and must close before its end.
#pragma once

#include <cstddef>
#include <string>
#include <vector>

namespace vqm::cardsim {

struct Argument {
    std::string text;      // without its quotes; blanks outside quotes dropped
    bool quoted = false;   // given as "..." (an empty "" too)
    bool present = false;  // anything given at all: "1,,3" leaves the middle one absent
    bool Empty() const { return !present; }
};

// Splits "a,\"b,c\",d" into its fields. An empty text is one absent field. False, with out
// cleared, for an unclosed quote, a quote after a field's text or text after its closing quote.
bool SplitArguments(const std::string& text, std::vector<Argument>* out);

// Where the command that starts at from ends: the index of the ';' that chains the next one,
// or text.size(). A ';' inside quotes belongs to a name or a text.
size_t CommandEnd(const std::string& text, size_t from);

}  // namespace vqm::cardsim
