// The tree of the blocks of a finished factor: a block hangs on the one that holds the first column of its tail. What
// is computed from the roots to the leaves walks it so that a block comes between its parent and its children.
//
// Two arrays of n words that are free once the matrix is factored hold it; f is the first row of a block:
//   position[f]  its width, in the low bits, and above them its first child + 1
//   jl[f]        where the walk goes when all that hangs on it is done, to the next child of its parent or of one above
//                that, or to the next root; -1 at the end
//   jl[k]        for the other rows of a block -2 - f
#pragma once

#include "cholesky/blocks.hpp"

namespace sm {

class BlockTree {
 public:
  explicit BlockTree(const NumericArrays& a) : a_(a) {}

  void build();
  Block at(i64 first) const {
    const i64 width = a_.position[first] & kWidthMask;
    return {first, width, a_.iu[first + 1] - a_.iu[first], a_.ju + a_.iju[first] + width - 1, a_.values + a_.iu[first]};
  }
  i64 block_of(i64 row) const { return a_.jl[row] < -1 ? -2 - a_.jl[row] : row; }
  i64 parent(const Block& b) const { return b.tail_length() > 0 ? block_of(b.tail[0]) : -1; }
  // Children come in ascending order; -1 when there is none.
  i64 child(i64 first) const { return (a_.position[first] >> kWidthBits) - 1; }
  bool is_last_child(i64 first, i64 parent) const { return a_.jl[first] == a_.jl[parent]; }
  // The walk, parents first; -1 at its end.
  i64 root() const { return root_; }
  i64 next(i64 first) const { return child(first) >= 0 ? child(first) : a_.jl[first]; }
  // What at(), child() and next() read of a block.
  void fetch_words(i64 first) const {
    __builtin_prefetch(a_.position + first);
    __builtin_prefetch(a_.jl + first);
    __builtin_prefetch(a_.iu + first);
    __builtin_prefetch(a_.iju + first);
    __builtin_prefetch(a_.diag + first);
  }

 private:
  static constexpr int kWidthBits = 8;
  static constexpr i64 kWidthMask = (i64{1} << kWidthBits) - 1;
  static_assert(kMostBlockRows <= kWidthMask);

  const NumericArrays& a_;
  i64 root_ = -1;
};

}  // namespace sm
