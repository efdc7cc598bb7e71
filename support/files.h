// Writing files so that a crash of the program or the machine leaves the old contents or the
// new ones, never a mixture.
#pragma once

#include <cstdio>
#include <string>

namespace vqm {

// Pushes what stdio buffered down to the disk, so that data reported written survives a
// crash of the program or the machine.
bool FlushToDisk(FILE* file);

// Writes data to "<path>.tmp", flushes it to disk and renames it over path.
bool ReplaceFile(const std::string& path, const std::string& data);

// Cuts a file of fixed-size records back to its whole records. An append killed part-way
// leaves a partial record, and the next append after it would shift every later record off
// the record grid; appends call this first.
void DropPartialTail(const std::string& path, size_t recordSize);

}  // namespace vqm
