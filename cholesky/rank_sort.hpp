// Short lists of columns in ascending order, without a comparison whose outcome the CPU would have to guess.
#pragma once

#include <algorithm>
#include <cstdint>

#include "frame/core.hpp"

#if defined(__GNUC__)
#pragma GCC diagnostic ignored "-Wpsabi"  // nothing returns vectors
#endif

namespace sm {

inline constexpr i64 kRankSorted = 64;  // columns at most: the work grows with their square
inline constexpr i64 kRankReach = i64{1} << 31;

// Each column goes where as many are smaller, counted for sixteen at a time. All are different, and in [first, first +
// kRankReach).
[[gnu::noinline]] inline void sort_by_ranks(i64* list, i64 count, i64 first) {
  typedef std::int32_t Keys __attribute__((vector_size(16)));
  constexpr i64 kKeys = 4;
  constexpr i64 kVectors = 4;
  constexpr i64 kTogether = kKeys * kVectors;
  static_assert(kRankSorted % kTogether == 0);
  alignas(Keys) std::int32_t key[kRankSorted];
  i64 column[kRankSorted];
  for (i64 t = 0; t < count; ++t) {
    column[t] = list[t];
    key[t] = static_cast<std::int32_t>(list[t] - first);
  }
  std::fill(key + count, key + (count + kTogether - 1) / kTogether * kTogether, 0);
  for (i64 t = 0; t < count; t += kTogether) {
    Keys own[kVectors];
    Keys rank[kVectors] = {};
    for (i64 v = 0; v < kVectors; ++v) {
      own[v] = Keys{key[t + 4 * v], key[t + 4 * v + 1], key[t + 4 * v + 2], key[t + 4 * v + 3]};
    }
    for (i64 s = 0; s < count; ++s) {
      const Keys other = Keys{} + key[s];
      for (i64 v = 0; v < kVectors; ++v) rank[v] -= other < own[v];  // true is -1
    }
    for (i64 r = 0; r < std::min(count - t, kTogether); ++r) list[rank[r / kKeys][r % kKeys]] = column[t + r];
  }
}

}  // namespace sm
