// Instances: their blocks, their registry of matrices, their table.
#pragma once

#include "frame/core.hpp"

namespace sm {

// Writes the 43 slots.
void fill_table(SmFunctionTable& table);

// Takes (or, when *block is set, clears) a zeroed block of `bytes` rounded down to whole words, plus 16 bytes.
[[nodiscard]] SmStatus zeroed_block(MemoryPool* pool, void** block, std::uint64_t bytes);

// Gives the record the next registry index and enters it. 101 when the registry could not grow.
[[nodiscard]] SmStatus register_matrix(SmInstance& instance, SmMatrix* matrix);

}  // namespace sm
