#include "cardsim/command_set.h"

namespace vqm::cardsim {

std::vector<std::unique_ptr<CommandSet>> StandardCommandSets() {
    std::vector<std::unique_ptr<CommandSet>> sets;
    return sets;
}

}  // namespace vqm::cardsim
