// Cutting the rows of U into blocks.
#include "cholesky/blocks.hpp"

#include <algorithm>

namespace sm {

void Blocks::find() {
  for (i64 first = 0; first < a_.n;) {
    i64 end = first + 1;
    while (end < a_.n && continues(end - 1)) ++end;
    cut(first, end);
    first = end;
  }
}

// Blocks of about the same width, none wider than the limit.
void Blocks::cut(i64 first, i64 end) {
  const i64 pieces = (end - first + kMostBlockRows - 1) / kMostBlockRows;
  const i64 even = (end - first + pieces - 1) / pieces;
  const i64 width = pieces == 1 ? even : (even + 7) / 8 * 8;
  for (i64 k = first; k < end; k += width) {
    a_.position[k] = std::min(width, end - k);
    a_.jl[k] = -1;
    for (i64 row = k + 1; row < std::min(k + width, end); ++row) a_.jl[row] = -2 - k;
  }
}

}  // namespace sm
