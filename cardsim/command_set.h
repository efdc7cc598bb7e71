// A group of AT commands the simulated card answers: its core queries (identity, signal,
// operator, volume, call list), the message memory, the phonebooks, the network services. Each group keeps its own memory,
// its own network-side control commands and its own lines of the card's kept state, so that
// the engine stays small and each group can be read and tested on its own.
#pragma once

#include <memory>
#include <ostream>
#include <string>
#include <vector>

namespace vqm::cardsim {

class CardEngine;

enum class Handled {
    No,      // not a command of this group
    Ok,      // done; the engine answers OK after the information lines
    Error,   // failed; the engine answers with errorText
    Prompt,  // the card answers "> " and hands the text typed up to Ctrl-Z to Complete
};

class CommandSet {
  public:
    virtual ~CommandSet() = default;

    // Called once when the group joins an engine; the engine outlives the group's use of it.
    void Attach(CardEngine* engine) { engine_ = engine; }

    // One command of an AT line without the "AT" and without the ';' that chains it: upper is
    // the upper-cased copy, original keeps the case of names and quoted text. Information
    // lines go to info, each as "\r\n<line>\r\n". On Handled::Error the final result is
    // errorText ("ERROR" unless changed, e.g. "+CMS ERROR: 321").
    virtual Handled Run(const std::string& upper, const std::string& original, std::string& info,
                        std::string& errorText) = 0;

    // The text typed after a Prompt, up to (not including) Ctrl-Z. Same conventions as Run;
    // returns false for an error.
    virtual bool Complete(const std::string& text, std::string& info, std::string& errorText) {
        (void)text, (void)info, (void)errorText;
        return false;
    }

    // A network-side control command ("deliver +4477 Hello", "capacity 10", ...): command is
    // the first word, rest the remainder of the line as typed. Returns "" when the command is
    // not this group's, else "OK", "OK <text>" or "ERROR: reason".
    virtual std::string Control(const std::string& command, const std::string& rest) {
        (void)command, (void)rest;
        return {};
    }
    // Lines for `vqm-cardsim --help`, each "  command ARGS   what it does\n".
    virtual std::string ControlHelp() const { return {}; }

    // Kept state: the group writes its own "name value..." lines and reads back the lines
    // whose name it owns (returns false for names that are not its own).
    virtual void Save(std::ostream& out) const { (void)out; }
    virtual bool Load(const std::string& name, const std::string& rest) {
        (void)name, (void)rest;
        return false;
    }
    // The content of a card that has never run before (the demo SIM).
    virtual void FillDemo() {}

  protected:
    CardEngine* engine_ = nullptr;
};

// The groups every simulated card has beyond the core group (which every engine makes for
// itself), in the order the engine asks them.
std::vector<std::unique_ptr<CommandSet>> StandardCommandSets();

}  // namespace vqm::cardsim
