// Blocks of rows of U, and the lists in which finished blocks wait for the block that they update next.
//
// Rows k and k + 1 of U with lengths L and L - 1, the first column of row k being k + 1, have the same structure but
// for that column. Runs of such rows are a block: its values are one stretch of factor_values, of rows that shorten by
// one, and the columns behind the block, its tail, are the same for all. The subscripts of its first row serve the
// block.
//
// While a factorization runs, two arrays of n words hold what is needed of the blocks; f is the first row of one:
//   position[f]  its width, in the low bits, and above them the place in its tail where its next update begins
//   jl[f]        until the block is finished the first of the blocks that wait for it, then the next in its own list;
//                -1 ends a list
//   jl[k]        for the other rows of a block -2 - f
#pragma once

#include "cholesky/numeric.hpp"

namespace sm {

inline constexpr i64 kMostBlockRows =
    128;  // wider ones are cut: a block and its target then fit the second-level cache

struct Block {
  i64 first;
  i64 width;
  i64 length;       // of the first row
  const i64* tail;  // columns behind the block
  double* values;   // of the first row

  i64 tail_length() const { return length + 1 - width; }
  // Row r, from the block's own column 0 on: what stands at c is the entry in column first + c, or first + width + c of
  // the tail; defined for c > r.
  double* row(i64 r) const { return values + r * length - r * (r - 1) / 2 - r - 1; }
};

// What a finished block has for its next target.
struct Source {
  i64 first;
  i64 width;
  i64 place;            // in the tail
  i64 count;            // columns from there on
  const i64* column;    // these columns
  double* value;        // theirs in the first row
  i64 step;             // from there to the same column one row on; one less from row to row
  const double* pivot;  // reciprocals
};

class Blocks {
 public:
  explicit Blocks(const NumericArrays& a) : a_(a) {}

  // Cuts the rows into blocks and empties all lists.
  void find();
  // Of a block that is not finished.
  i64 width(i64 first) const { return a_.position[first]; }
  Block at(i64 first, i64 width) const {
    return {first, width, a_.iu[first + 1] - a_.iu[first], a_.ju + a_.iju[first] + width - 1, a_.values + a_.iu[first]};
  }
  // f(source) for every block that waits for block `first`; f makes it wait elsewhere. Sources are read some at a time,
  // so that what they need from memory is under way before the first of them is used.
  template <class F>
  void for_each_waiting(i64 first, F&& f) const {
    for (i64 i = a_.jl[first]; i >= 0;) {
      Source batch[kBatch];
      int count = 0;
      for (; i >= 0 && count < kBatch; i = a_.jl[i]) {
        batch[count] = source(i);
        __builtin_prefetch(batch[count].column);
        __builtin_prefetch(batch[count].value, 1);
        ++count;
      }
      for (int s = 0; s < count; ++s) f(batch[s]);
    }
  }
  // The finished block waits for the block that holds its column `done` places on.
  void await(const Source& s, i64 done) const {
    if (done < s.count) queue(s.first, s.width, s.place + done, s.column[done]);
  }
  void await(const Block& b) const {
    if (b.tail_length() > 0) queue(b.first, b.width, 0, b.tail[0]);
  }

 private:
  static constexpr int kBatch = 16;
  static constexpr int kWidthBits = 8;
  static constexpr i64 kWidthMask = (i64{1} << kWidthBits) - 1;
  static_assert(kMostBlockRows <= kWidthMask);

  Source source(i64 first) const {
    const i64 word = a_.position[first];
    const i64 width = word & kWidthMask;
    const i64 place = word >> kWidthBits;
    const i64 length = a_.iu[first + 1] - a_.iu[first];
    return {first,
            width,
            place,
            length + 1 - width - place,
            a_.ju + a_.iju[first] + width - 1 + place,
            a_.values + a_.iu[first] + width - 1 + place,
            length - 1,
            a_.diag + first};
  }
  bool continues(i64 k) const {
    const i64 length = a_.iu[k + 1] - a_.iu[k];
    return length > 0 && a_.iu[k + 2] - a_.iu[k + 1] == length - 1 && a_.ju[a_.iju[k]] == k + 1;
  }
  void cut(i64 first, i64 end);
  void queue(i64 first, i64 width, i64 place, i64 column) const {
    const i64 mark = a_.jl[column];
    const i64 target = mark < -1 ? -2 - mark : column;
    a_.position[first] = place << kWidthBits | width;
    a_.jl[first] = a_.jl[target];
    a_.jl[target] = first;
  }

  const NumericArrays& a_;
};

}  // namespace sm
