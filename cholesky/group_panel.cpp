#include "cholesky/group_panel.hpp"

#include <algorithm>

namespace sm {

void GroupPanel::pack_leader(i64 begin, i64 end) {
  const Source& s = group_.leader();
  const double* v = s.value + begin;
  double* row = panel_;
  for (i64 r = 0; r < s.width; ++r, row += tiles_.tile_columns) {
    double* out = row;
    for (i64 j = 0; j < end - begin; j += tiles_.tile_columns, out += tile_step_) {
      const i64 columns = std::min(tiles_.tile_columns, end - begin - j);
      std::copy_n(v + j, columns, out);
      std::fill(out + columns, out + tiles_.tile_columns, 0.0);
    }
    v += s.step - r;
  }
}

// Answers which of the follower's columns comes next.
i64 GroupPanel::pack_follower(const Source& s, i64 begin, i64 end, i64 next, double* out) const {
  const i64* column = group_.leader().column + begin;
  const double* v = s.value + next;
  i64 found = 0;
  for (i64 r = 0; r < s.width; ++r, out += tiles_.tile_columns) {
    found = tiles_.expand(column, end - begin, s.column + next, s.count - next, v, out, tile_step_);
    v += s.step - r;
  }
  return next + found;
}

// What the packing of a source will read.
void GroupPanel::fetch(const Source& s, i64 next, i64 columns) const {
  const i64 end = std::min(s.count, next + columns);
  for (i64 j = next; j < end; j += 8) {
    __builtin_prefetch(s.column + j);
    __builtin_prefetch(s.value + j, 1);
  }
}

void GroupPanel::pack(i64 begin, i64 end) {
  if (begin == 0) std::fill_n(next_, group_.count, 0);
  fetch(group_.source[1], next_[1], end - begin);
  pack_leader(begin, end);
  double* row = panel_ + group_.leader().width * tiles_.tile_columns;
  for (int i = 1; i < group_.count; ++i) {
    const Source& s = group_.source[i];
    if (i + 1 < group_.count) fetch(group_.source[i + 1], next_[i + 1], end - begin);
    next_[i] = pack_follower(s, begin, end, next_[i], row);
    row += s.width * tiles_.tile_columns;
  }
}

void GroupPanel::find_coefficients(i64 columns, i64 strip_rows, double* out) const {
  for (i64 c = 0; c < columns; c += strip_rows) {
    const i64 rows = std::min(strip_rows, columns - c);
    const double* v = at(c);
    for (const Source& s : group_) {
      for (i64 r = 0; r < s.width; ++r, v += tiles_.tile_columns, out += strip_rows) {
        const double d = -s.pivot[r];
        for (i64 i = 0; i < rows; ++i) out[i] = v[i] * d;
      }
    }
  }
}

void GroupPanel::keep_multipliers(i64 columns, i64 strip_rows, const double* coefficient) const {
  const i64* column = group_.leader().column;
  for (Source& s : group_) {
    s.done = 0;
    for (i64 c = 0; c < columns && s.done < s.count; ++c) {
      if (s.column[s.done] != column[c]) continue;
      const double* from = coefficient + c / strip_rows * strip_rows * group_.rows + c % strip_rows;
      double* v = s.value + s.done;
      for (i64 r = 0; r < s.width; ++r, from += strip_rows) {
        *v = *from;
        v += s.step - r;
      }
      ++s.done;
    }
    coefficient += s.width * strip_rows;
  }
}

}  // namespace sm
