// The link's own waits (the wait for a reply's first byte, the silence that ends a reply, the
// cache builders' pauses) cut to a tenth, so that tests against a card on a pseudo-terminal
// run quickly while every wait still happens in its order.
#pragma once

#include <chrono>
#include <thread>

#include "link/link.h"

namespace vqm::testing {

inline void ShortenLinkWaits(Link& link) {
    link.sleepMs = [](int ms) { std::this_thread::sleep_for(std::chrono::milliseconds(ms / 10)); };
}

}  // namespace vqm::testing
