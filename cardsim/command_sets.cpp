#include "cardsim/call_waiting.h"
#include "cardsim/command_set.h"
#include "cardsim/message_memory.h"
#include "cardsim/network_services.h"
#include "cardsim/phonebooks.h"

namespace vqm::cardsim {

std::vector<std::unique_ptr<CommandSet>> StandardCommandSets() {
    std::vector<std::unique_ptr<CommandSet>> sets;
    sets.push_back(std::make_unique<NetworkServices>());
    sets.push_back(std::make_unique<Phonebooks>());
    sets.push_back(std::make_unique<MessageMemory>());
    sets.push_back(std::make_unique<CallWaiting>());
    return sets;
}

}  // namespace vqm::cardsim
