// What bounds a job that copying and dgemm do not: a load whose address the load before it gave, adding to places that
// a list names, and adding vectors that are in the caches.
#pragma once

#include <cstddef>
#include <cstdint>
#include <vector>

namespace sm::bench {

// next[k] of one cycle through 0 .. count - 1 in random order.
std::vector<std::uint32_t> random_cycle(std::uint32_t count);

// Seconds a load over `bytes` of memory, one load a line of the cache.
double dependent_load(std::size_t bytes);

// Seconds for y[place[k]] += a * x[k], in runs of a few ascending places over `bytes` of y, as thin rows of a factor
// add to others.
double scattered_addition(std::size_t bytes);

// The sum of value[k] x[place[k]], and y[place[k]] += a value[k]: what a product from one triangle asks of the memory,
// with no rows in it.
double exchange(const std::int64_t* place, const double* value, std::size_t count, const double* x, double* y);

// Bytes a second of y += a * x, three words an element, x and y together as large.
double vector_update(std::size_t bytes);

}  // namespace sm::bench
