#include "bench/generators/problem.hpp"

#include "bench/generators/random.hpp"

namespace sm::bench {

Triplets shuffled(const Triplets& entries) {
  Triplets out = entries;
  Random random(99);
  for (std::size_t k = out.size(); k > 1; --k) {  // Fisher and Yates
    const auto other = static_cast<std::size_t>(random.uniform() * static_cast<double>(k));
    std::swap(out.row[k - 1], out.row[other]);
    std::swap(out.col[k - 1], out.col[other]);
    std::swap(out.value[k - 1], out.value[other]);
  }
  return out;
}

}  // namespace sm::bench
