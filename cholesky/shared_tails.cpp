// Adding the square of a finished block to those of the blocks with the same tail.
#include "cholesky/shared_tails.hpp"

#include <algorithm>

namespace sm {

namespace {

bool is_same(const SharedTails::SharedTail& tail, const Block& block) {
  return tail.count == block.tail_length() && std::equal(tail.column, tail.column + tail.count, block.tail);
}

}  // namespace

double* SharedTails::square_for(const Block& block) {
  const i64 count = block.tail_length();
  if (count == 0 || count > kMostSharedColumns) return nullptr;
  const i64 slot = block.tail[0] % kTails;
  SharedTail& tail = tails_[slot];
  if (!is_same(tail, block)) {
    if (!tail.is_open) tail = {.column = block.tail, .count = count};
    return nullptr;
  }
  if (!tail.is_open) {
    tail.is_open = true;
    tail.sum = sums_[slot];
    std::fill_n(tail.sum, kMostSharedColumns * kMostSharedColumns, 0.0);
    next_row_ = std::min(next_row_, block.tail[0]);
  }
  return tail.sum;
}

}  // namespace sm
