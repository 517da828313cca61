// Adding the square of a finished block to those of the blocks with the same tail.
#include "cholesky/shared_tails.hpp"

#include <algorithm>

namespace sm {

namespace {

bool is_same(const SharedTails::SharedTail& tail, const Block& block) {
  return tail.count == block.tail_length() && std::equal(tail.column, tail.column + tail.count, block.tail);
}

// Strips of the upper triangle, as far as it goes beyond the strip's first row.
void add_square(const Source& s, double* sum, Panels& panels) {
  const TileKernels& tiles = tile_kernels();
  const i64 height = tiles.strip_rows;
  find_coefficients(s, s.count, panels.coefficient);
  for (i64 r = 0; r < s.count; r += height) {
    const int rows = static_cast<int>(std::min(height, s.count - r));
    double* target[kMostStripRows];
    for (int i = 0; i < rows; ++i) target[i] = sum + (r + i) * kMostSharedColumns + r;
    const TileSource source = {s.value + r, s.step, 1, tiles.tile_columns};
    tiles.strip(rows, s.width, panels.coefficient + r * s.width, source, s.count - r, target, Finish::add);
  }
  keep_multipliers(s, s.count, panels.coefficient);
}

}  // namespace

bool SharedTails::take(const Block& block, const double* diag, Panels& panels) {
  const i64 count = block.tail_length();
  if (count == 0 || count > kMostSharedColumns) return false;
  const i64 slot = block.tail[0] % kTails;
  SharedTail& tail = tails_[slot];
  if (!is_same(tail, block)) {
    if (!tail.is_open) {
      tail.column = block.tail;
      tail.count = count;
    }
    return false;
  }
  if (!tail.is_open) {
    tail.is_open = true;
    tail.sum = sums_[slot];
    std::fill_n(tail.sum, count * kMostSharedColumns, 0.0);
    next_row_ = std::min(next_row_, block.tail[0]);
  }
  add_square(Blocks::all_of(block, diag), tail.sum, panels);
  return true;
}

}  // namespace sm
