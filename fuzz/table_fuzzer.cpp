#include "fuzz/table_entry.hpp"

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  sm::fuzz::read_table(data, size);
  return 0;
}
