// What the fuzzer does with a block of bytes, and the tests with the corpus.
#pragma once

#include <cstddef>
#include <cstdint>

namespace sm::fuzz {

// Reads the bytes as a Matrix Market file and aborts when the reader breaks a promise: entries that are outside the
// matrix, not finite or below the diagonal of a symmetric file; another number of entries than announced; a message
// that lacks the name or has unprintable bytes; an outcome that depends on how the bytes are cut into pieces.
void read_bytes(const std::uint8_t* data, std::size_t size);

}  // namespace sm::fuzz
