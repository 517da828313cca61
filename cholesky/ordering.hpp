// The roads of the minimum-degree ordering. Both give the same permutation for every pattern.
#pragma once

#include <cstdint>

#include "frame/core.hpp"

namespace sm {

// Vertices of more neighbours are long.
inline constexpr i64 kShort = 32;

// Columns of a long row are looked at so many at a time while each is the next one of the matrix, as in a border.
inline constexpr i64 kNeighbours = 8;

inline bool are_neighbours(const i64* column) {
  const i64 first = *column;
  if (column[kNeighbours - 1] != first + kNeighbours - 1) return false;
  i64 differs = 0;
  for (i64 q = 1; q < kNeighbours; ++q) differs |= column[q] ^ (first + q);
  return differs == 0;
}

// The edges of a matrix's graph: entries above the diagonal, a repeated one counted once.
struct EdgeCount {
  i64 edges = 0;
  bool tidy = true;      // every row ascends, so that none is repeated
  i64 long_rows = 0;     // long vertices
  i64 long_entries = 0;  // their neighbours, summed
};

// Leaves in degree[i] the number of neighbours of row i. Both arrays have a word for each row.
EdgeCount count_edges(const SmMatrix& m, i64* degree, i64* met);

// Which road an ordering takes, and with how wide an index. Only tests ask for a certain one.
enum class Road { best, narrow, wide, plain };
[[nodiscard]] SmStatus order_by(SmMatrix& m, Road road);

// With `half` words for each of two vectors in `work` and then a word for each row. False when the items do not fit.
[[nodiscard]] bool order_plainly(const SmMatrix& m, i64* work, i64 half, i64* perm, i64* inv_perm);

}  // namespace sm
