#include "fuzz/reader_entry.hpp"

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  sm::fuzz::read_bytes(data, size);
  return 0;
}
