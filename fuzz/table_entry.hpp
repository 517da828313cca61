// What the fuzzer of tables does with a block of bytes, and the tests with its corpus.
#pragma once

#include <cstddef>
#include <cstdint>

namespace sm::fuzz {

// Takes the first line for a formula and the rest, where there is one, for a table. Reads both, makes the model of the
// formula over a table of its own and over that of the input, and the new rows of the latter. Aborts when a promise is
// broken: numbers that are not finite, levels and columns out of range, cells that are not found again, anything thrown
// but a ModelError with a place, and a message with control characters.
void read_table(const std::uint8_t* data, std::size_t size);

}  // namespace sm::fuzz
