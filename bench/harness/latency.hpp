// What a load takes whose address the load before it gave.
#pragma once

#include <cstddef>
#include <cstdint>
#include <vector>

namespace sm::bench {

// next[k] of one cycle through 0 .. count - 1 in random order.
std::vector<std::uint32_t> random_cycle(std::uint32_t count);

// Seconds a load over `bytes` of memory, one load a line of the cache.
double dependent_load(std::size_t bytes);

}  // namespace sm::bench
