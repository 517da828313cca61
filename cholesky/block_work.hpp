// The two dense steps of the blocked factorization: a block updating a later one, and the factorization of a block.
#pragma once

#include "cholesky/blocks.hpp"
#include "cholesky/tiles.hpp"

namespace sm {

inline constexpr i64 kPanelColumns = 240;  // a multiple of every tile
static_assert(kMostBlockRows <= kPanelColumns, "the rows that a block updates are columns of the first panel");

// Work memory of fixed size, on the stack: 396 kB.
struct Panels {
  alignas(64) double source[kMostBlockRows * kPanelColumns];
  alignas(64) double coefficient[kMostBlockRows * kMostBlockRows];
  alignas(64) double sums[kMostStripRows * kPanelColumns];
  Run run[kPanelColumns];
  std::int32_t to[kPanelColumns];
};

// A block that takes updates: place[c] is, for the columns c of its tail, their place in a row of it.
struct Target {
  const Block& block;
  const i64* place;
  double* diag;

  i64 end() const { return block.first + block.width; }
  // How many of the source's columns are rows here.
  i64 rows_of(const Source& s) const {
    i64 rows = 0;
    while (rows < s.count && s.column[rows] < end()) ++rows;
    return rows;
  }
  i64 place_of(i64 column) const { return column < end() ? column - block.first : place[column]; }
  // Of `count` columns, the first `own` of which are the block's own. No comparing: it could not be guessed.
  void find_places(const i64* column, i64 own, i64 count, std::int32_t* to) const {
    for (i64 j = 0; j < own; ++j) to[j] = static_cast<std::int32_t>(column[j] - block.first);
    for (i64 j = own; j < count; ++j) to[j] = static_cast<std::int32_t>(place[column[j]]);
  }
};

// Subtracts what the group has for the rows of its leader's first columns, `done` of them, which are rows of the target;
// notes how many of these its followers have.
void update_block(const Target& target, const SourceGroup& group, Panels& panels);

// Factors the block, all of whose updates are in: pivots from diag, multipliers among its own rows, raw values behind.
// With a square for its short tail (shared_tails.hpp) -V' D V of the tail is added to that, and multipliers are left.
[[nodiscard]] SmStatus factor_block(const Block& block, double* diag, double* square, Pivots& pivots, Panels& panels);

}  // namespace sm
