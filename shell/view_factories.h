// The views of this build, by table index. Kept apart from the main window so that each
// subsystem's views can build on the shell while the program brings them all together.
#pragma once

#include <array>

#include "shell/main_window.h"

namespace vqm {

// A view still to come is an empty window of its class.
std::array<ViewFactory, kViewCount> DefaultViewFactories();

}  // namespace vqm
