// Blocks of rows of U, and the lists in which finished blocks wait for the block that they update next.
//
// Rows k and k + 1 of U with lengths L and L - 1, the first column of row k being k + 1, have the same structure but
// for that column. Runs of such rows are a block: its values are one stretch of factor_values, of rows that shorten by
// one, and the columns behind the block, its tail, are the same for all. The subscripts of its first row serve the
// block.
//
// While a factorization runs, two arrays of n words hold what is needed of the blocks; f is the first row of one:
//   position[f]  its width, in the low bits, whether it follows another, and above them the place in its tail where its
//                next update begins
//   jl[f]        until the block is finished the first of the blocks that wait for it, then the next in its own list;
//                -1 ends a list
//   jl[k]        for the other rows of a block -2 - f
//
// When a block has updated another one, what is left of its tail is part of that one's tail. If that is most of it, the
// block follows the other from then on: the two wait in one list, the follower behind its leader, and update later
// blocks as one source of more rows (group_panel.hpp). What follows it comes with it. Followers have not all columns of
// their leader, and may have none in the block that the leader updates. Where a follower has no column, zeros meet its
// entries and multipliers: these must be finite.
#pragma once

#include <algorithm>

#include "cholesky/numeric.hpp"

namespace sm {

inline constexpr i64 kMostBlockRows =
    128;  // wider ones are cut: a block and its target then fit the second-level cache

inline constexpr i64 kMostGroupRows = 32;

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
  bool follows;         // the source before it in its list
  i64 done;             // columns that have been rows of the target
};

// A leader, and what follows it.
struct SourceGroup {
  Source* source;
  int count;
  i64 rows;  // of all

  Source& leader() const { return *source; }
  Source* begin() const { return source; }
  Source* end() const { return source + count; }
};

// What will follow a block that is in work.
struct Followers {
  i64 rows = 0;
  i64 first = -1;
  i64 last = -1;
};

class Blocks {
 public:
  explicit Blocks(const NumericArrays& a) : a_(a), fetched_(a.iu[a.n] > kCached ? kFetched : 0) {}

  // Cuts the rows into blocks and empties all lists.
  void find();
  // Of a block that is not finished.
  i64 width(i64 first) const { return a_.position[first]; }
  Block at(i64 first, i64 width) const {
    return {first, width, a_.iu[first + 1] - a_.iu[first], a_.ju + a_.iju[first] + width - 1, a_.values + a_.iu[first]};
  }
  // f(group) for every group that waits for block `first`; f makes it wait elsewhere, or follow the block. Some sources
  // are read ahead, so that what they need from memory is under way before they are used, and the next link too.
  template <class F>
  void for_each_waiting(i64 first, F&& f) const {
    Source queue[kQueue];
    Source* begin = queue;
    Source* end = queue;
    i64 next = a_.jl[first];
    const auto read = [&] {
      *end++ = source(next);
      next = a_.jl[next];
      if (next >= 0) fetch_words(next);
    };
    for (;;) {
      for (int i = 0; i < 3 && next >= 0 && end < begin + kAhead; ++i) read();
      if (begin == end) return;
      SourceGroup group = {begin, 0, 0};
      do {
        group.rows += begin->width;
        ++group.count;
        ++begin;
        if (begin == end && next >= 0) read();
      } while (begin < end && begin->follows);
      f(group);
      if (begin + kAhead > queue + kQueue - kMostGroupRows) {
        end = std::copy(begin, end, queue);
        begin = queue;
      }
    }
  }
  // While block `first` is in work: what waits for rows some way on, as far as it is known, and where that is.
  [[gnu::always_inline]] void fetch_ahead(i64 first) const {
    if (first + 2 * kRowsAhead >= a_.n) return;
    const i64 later = a_.jl[first + 2 * kRowsAhead];
    if (later >= 0) fetch_words(later);
    const i64 soon = a_.jl[first + kRowsAhead];
    if (soon < 0) return;
    const Source s = source(soon);
    static_cast<void>(s);
    const i64 second = a_.jl[soon];
    if (second >= 0) fetch_words(second);
  }
  // The group waits for the block that holds its leader's next column.
  void await(const SourceGroup& group) const {
    const Source& leader = group.leader();
    if (leader.done == leader.count) return;
    queue(leader.first, word_of(leader, 0), leader.column[leader.done]);
    if (group.count > 1) await_behind_leader(group);
  }
  // Whether the group is to follow the block of which `followers` are known, which it has updated.
  bool can_follow(const SourceGroup& group, const Block& block, const Followers& followers) const {
    const Source& leader = group.leader();
    return block.tail_length() >= kFewestGroupColumns && (leader.count - leader.done) * 5 >= block.tail_length() * 4 &&
           block.width + followers.rows + group.rows <= kMostGroupRows && is_finite(leader);
  }
  void follow(const SourceGroup& group, Followers& followers) const;
  void await(const Block& b, const Followers& followers) const {
    if (b.tail_length() == 0) return;
    queue(b.first, b.width, b.tail[0]);
    if (followers.first < 0) return;
    a_.jl[followers.last] = a_.jl[b.first];
    a_.jl[b.first] = followers.first;
  }

 private:
  static constexpr i64 kCached = 1 << 21;  // entries of U that are in the third-level cache when they are needed again
  static constexpr i64 kFetched = 40;
  static constexpr i64 kRowsAhead = 6;
  static constexpr int kAhead = 16;
  static constexpr int kQueue = 64 + kMostGroupRows;
  static constexpr i64 kFewestGroupColumns = 32;
  static constexpr int kWidthBits = 8;
  static constexpr int kPlaceBit = kWidthBits + 1;
  static constexpr i64 kWidthMask = (i64{1} << kWidthBits) - 1;
  static constexpr i64 kFollows = i64{1} << kWidthBits;
  static_assert(kMostBlockRows <= kWidthMask);

  Source source(i64 first) const {
    const i64 word = a_.position[first];
    const i64 width = word & kWidthMask;
    const i64 place = word >> kPlaceBit;
    const i64 length = a_.iu[first + 1] - a_.iu[first];
    const i64* column = a_.ju + a_.iju[first] + width - 1 + place;
    double* value = a_.values + a_.iu[first] + width - 1 + place;
    __builtin_prefetch(column);
    __builtin_prefetch(column + 8);
    __builtin_prefetch(value, 1);
    __builtin_prefetch(value + 8, 1);
    const i64 fetched = std::min(length + 1 - width - place, fetched_);
    for (i64 j = 16; j < fetched; j += 8) {
      __builtin_prefetch(column + j);
      __builtin_prefetch(value + j, 1);
    }
    __builtin_prefetch(a_.diag + first);
    return {first, width,      place,           length + 1 - width - place, column,
            value, length - 1, a_.diag + first, (word & kFollows) != 0,     0};
  }
  [[gnu::always_inline]] void fetch_words(i64 first) const {
    __builtin_prefetch(a_.position + first);
    __builtin_prefetch(a_.jl + first);
    __builtin_prefetch(a_.iu + first);
    __builtin_prefetch(a_.iju + first);
    __builtin_prefetch(a_.diag + first);
  }
  bool follows(i64 first) const { return (a_.position[first] & kFollows) != 0; }
  static i64 word_of(const Source& s, i64 follows) { return (s.place + s.done) << kPlaceBit | follows | s.width; }
  bool continues(i64 k) const {
    const i64 length = a_.iu[k + 1] - a_.iu[k];
    return length > 0 && a_.iu[k + 2] - a_.iu[k + 1] == length - 1 && a_.ju[a_.iju[k]] == k + 1;
  }
  void cut(i64 first, i64 end);
  bool is_finite(const Source& s) const;
  void await_behind_leader(const SourceGroup& group) const;
  void queue(i64 first, i64 word, i64 column) const {
    const i64 mark = a_.jl[column];
    const i64 target = mark < -1 ? -2 - mark : column;
    a_.position[first] = word;
    a_.jl[first] = a_.jl[target];
    a_.jl[target] = first;
  }

  const NumericArrays& a_;
  const i64 fetched_;  // entries of a source, as far as they are asked for when it is read
};

}  // namespace sm
