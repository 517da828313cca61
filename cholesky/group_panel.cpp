#include "cholesky/group_panel.hpp"

#include <algorithm>

namespace sm {

void GroupPanel::pack_leader(i64 begin, i64 end) {
  const Source& s = group_.leader();
  const double* v = s.value + begin;
  double* row = panel_;
  for (i64 r = 0; r < s.width; ++r, row += tile_columns_) {
    double* out = row;
    for (i64 j = 0; j < end - begin; j += tile_columns_, out += tile_step_) {
      const i64 columns = std::min(tile_columns_, end - begin - j);
      std::copy_n(v + j, columns, out);
      std::fill(out + columns, out + tile_columns_, 0.0);
    }
    v += s.step - r;
  }
}

// Answers which of the follower's columns comes next.
i64 GroupPanel::pack_follower(const Source& s, i64 begin, i64 end, i64 next, double* out) const {
  const i64* column = group_.leader().column;
  for (i64 j = begin; j < end; j += tile_columns_, out += tile_step_) {
    const i64 columns = std::min(tile_columns_, end - j);
    i64 x = 0;
    for (; x < columns && next < s.count; ++x) {
      const bool has = s.column[next] == column[j + x];
      const double* v = s.value + next;
      for (i64 r = 0; r < s.width; ++r) {
        out[r * tile_columns_ + x] = has ? *v : 0.0;
        v += s.step - r;
      }
      next += has;
    }
    for (i64 r = 0; r < s.width; ++r) std::fill(out + r * tile_columns_ + x, out + (r + 1) * tile_columns_, 0.0);
  }
  return next;
}

void GroupPanel::pack(i64 begin, i64 end) {
  if (begin == 0) std::fill_n(next_, group_.count, 0);
  pack_leader(begin, end);
  double* row = panel_ + group_.leader().width * tile_columns_;
  for (int i = 1; i < group_.count; ++i) {
    const Source& s = group_.source[i];
    next_[i] = pack_follower(s, begin, end, next_[i], row);
    row += s.width * tile_columns_;
  }
}

void GroupPanel::find_coefficients(i64 columns, i64 strip_rows, double* out) const {
  for (i64 c = 0; c < columns; c += strip_rows) {
    const i64 rows = std::min(strip_rows, columns - c);
    const double* v = at(c);
    for (const Source& s : group_) {
      for (i64 r = 0; r < s.width; ++r, v += tile_columns_, out += strip_rows) {
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
