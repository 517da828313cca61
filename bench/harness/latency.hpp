// What memory takes where it is not read in a row: a load whose address the load before it gave, and adding to places that
// a list names.
#pragma once

#include <cstddef>
#include <cstdint>
#include <vector>

namespace sm::bench {

// next[k] of one cycle through 0 .. count - 1 in random order.
std::vector<std::uint32_t> random_cycle(std::uint32_t count);

// Seconds a load over `bytes` of memory, one load a line of the cache.
double dependent_load(std::size_t bytes);

// Seconds for y[place[k]] += a * x[k], in runs of a few ascending places over `bytes` of y, as thin rows of a factor add
// to others.
double scattered_addition(std::size_t bytes);

}  // namespace sm::bench
