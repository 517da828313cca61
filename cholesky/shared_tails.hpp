// Updates of blocks that have one tail, summed before they are added anywhere.
//
// The blocks of subjects, of clusters or of full sibs often touch the same few later columns. All that such a block has
// for them is one small square, -V' D V, so that the squares of equal tails are added up here as the blocks are
// finished, while their rows are in the cache. The sum goes into the rows of U once, when these are in work. A block
// that was summed waits in no list, and its rows hold multipliers at once.
//
// A tail is summed from the second block on that has it: one that comes once is better off in the lists.
#pragma once

#include <algorithm>
#include <limits>

#include "cholesky/block_work.hpp"

namespace sm {

class SharedTails {
 public:
  // What the block, once it is factored, adds its square to instead of waiting in a list; null: it waits.
  double* square_for(const Block& block);
  // Whether rows before `end` have something to come from here, all rows before them being done.
  bool has_rows_before(i64 end) const { return next_row_ < end; }
  // add(i, tail) for every row tail.column[i] before `end` and each tail that has it.
  template <class F>
  void for_each_row_before(i64 end, F&& add) {
    next_row_ = kNone;
    for (SharedTail& tail : tails_) {
      if (!tail.is_open) continue;
      for (; tail.done < tail.count && tail.column[tail.done] < end; ++tail.done) add(tail.done, tail);
      if (tail.done == tail.count) {
        tail = {};
      } else {
        next_row_ = std::min(next_row_, tail.column[tail.done]);
      }
    }
  }

  struct SharedTail {
    const i64* column = nullptr;
    i64 count = 0;
    i64 done = 0;  // of the columns, as rows
    bool is_open = false;
    double* sum = nullptr;
    // Element (i, j) of the square, j >= i.
    double at(i64 i, i64 j) const { return sum[i * kMostSharedColumns + j]; }
  };

 private:
  static constexpr i64 kTails = 8;
  static constexpr i64 kNone = std::numeric_limits<i64>::max();
  SharedTail tails_[kTails];
  i64 next_row_ = kNone;
  alignas(64) double sums_[kTails][kMostSharedColumns * kMostSharedColumns];
};

}  // namespace sm
