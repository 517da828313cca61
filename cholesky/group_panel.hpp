// The rows of a group of sources, side by side in the columns of its leader.
//
// A follower's columns are columns of its leader; where it lacks one, a zero stands in the panel. The group then takes
// one pass over its target with register tiles, where each of its sources would add to the same scattered places.
#pragma once

#include "cholesky/blocks.hpp"
#include "cholesky/tiles.hpp"

namespace sm {

class GroupPanel {
 public:
  GroupPanel(const SourceGroup& group, double* panel)
      : group_(group), tiles_(tile_kernels()), tile_step_(tiles_.tile_columns * group.rows), panel_(panel) {}

  // Columns [begin, end) of the leader, for all rows; panels come in ascending order, and begin with whole tiles.
  void pack(i64 begin, i64 end);
  // Column `column` of the panel.
  const double* at(i64 column) const {
    return panel_ + column / tiles_.tile_columns * tile_step_ + column % tiles_.tile_columns;
  }
  // -V D of the first columns of the first panel, strip by strip, the rows of the group one behind the other.
  void find_coefficients(i64 columns, i64 strip_rows, double* coefficient) const;
  // Puts these where the columns are, and notes how many each source has.
  void keep_multipliers(i64 columns, i64 strip_rows, const double* coefficient) const;

 private:
  void pack_leader(i64 begin, i64 end);
  void fetch(const Source& s, i64 next, i64 columns) const;
  i64 pack_follower(const Source& s, i64 begin, i64 end, i64 next, double* out) const;

  const SourceGroup& group_;
  const TileKernels& tiles_;
  const i64 tile_step_;
  double* const panel_;
  i64 next_[kMostGroupRows];  // of each source's columns
};

}  // namespace sm
