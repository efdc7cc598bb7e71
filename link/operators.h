// The table that turns the numeric operator codes the card reports into names, and back.
#pragma once

#include <cstddef>
#include <cstdint>

namespace vqm {

// Writes the name of the operator with this code (NUL-terminated, within nameSize) and
// returns its length; 0 when the code is unknown, writing nothing.
int OperatorNameByCode(uint32_t code, char* name, size_t nameSize);

// The code of the first operator whose name equals name; -1 when none does.
int32_t OperatorCodeByName(const char* name);

}  // namespace vqm
