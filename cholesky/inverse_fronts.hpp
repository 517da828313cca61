// Z in full squares for the blocks whose children are still to come.
//
// The columns of a block's tail are among the columns of its parent: Z on the tail is a part of the parent's square,
// its front. Where it is most of it, nothing is copied: the block's own rows and columns are put before the front's,
// which has room for some more, and the front then serves the block too, with columns that it has not. What stands
// there is Z as well, so that it may be multiplied by zeros. When the next child of the parent comes, its front is what
// it was.
#pragma once

#include "cholesky/inverse_work.hpp"

namespace sm {

struct Front {
  i64 block;
  Square z;
  i64* column;  // ascending: all of the block, and others of blocks above it
  i64 order;
  i64 room;   // for rows and columns before the first
  i64 taken;  // what is given back with it
};

class FrontStack {
 public:
  FrontStack(double* values, i64 capacity, i64* columns) : values_(values), capacity_(capacity), columns_(columns) {}

  // Values that a front may take.
  static i64 size(i64 order) { return step_of(order) * step_of(order); }
  // The front of block `parent`, or null; those of finished blocks are dropped.
  const Front* find(i64 parent);
  // Whether one more can be kept that is not in place of another.
  bool has_place() const { return count_ < kMostFronts; }
  // A new one, of which neither columns nor values are there; false when there is no room.
  bool open(i64 order, Front& front);
  // `width` more columns before those of another one, none of them there yet.
  static Front grown(const Front& front, i64 width);
  // Keeps it for block `block`; in_place: the parent's one is not needed any more.
  void keep(Front& front, i64 block, bool in_place);

 private:
  static constexpr i64 kMostFronts = 512;

  // Not a multiple of large powers of two, which would bring the elements of a column to a few places of a cache.
  static i64 step_of(i64 order) { return (order + order / 4 + 7) / 8 * 8 | 8; }

  double* values_;
  i64 capacity_;
  i64* columns_;
  i64 used_ = 0;
  i64 columns_used_ = 0;
  i64 count_ = 0;
  Front fronts_[kMostFronts];
};

// place[j] <- where column[j], j < count, is in the front, for ascending columns that are all there.
void find_places(const Front& front, const i64* column, i64 count, i64* place);

}  // namespace sm
