#include "cardsim/arguments.h"

namespace vqm::cardsim {

bool SplitArguments(const std::string& text, std::vector<Argument>* out) {
    out->clear();
    Argument field;
    bool inQuotes = false, closed = false;
    for (char c : text) {
        if (inQuotes) {
            if (c == '"') {
                inQuotes = false;
                closed = true;
            } else {
                field.text.push_back(c);
            }
        } else if (c == ',') {
            out->push_back(field);
            field = Argument{};
            closed = false;
        } else if (c == ' ' || c == '\t') {
            continue;
        } else if (closed || (c == '"' && field.present)) {
            out->clear();
            return false;
        } else if (c == '"') {
            inQuotes = field.quoted = field.present = true;
        } else {
            field.text.push_back(c);
            field.present = true;
        }
    }
    if (inQuotes) {
        out->clear();
        return false;
    }
    out->push_back(field);
    return true;
}

size_t CommandEnd(const std::string& text, size_t from) {
    bool quoted = false;
    for (size_t i = from; i < text.size(); ++i) {
        if (text[i] == '"') quoted = !quoted;
        if (text[i] == ';' && !quoted) return i;
    }
    return text.size();
}

}  // namespace vqm::cardsim
