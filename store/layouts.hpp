// Where elements live: the index arithmetic of every storage layout, and nothing else.
#pragma once

#include "frame/core.hpp"

namespace sm {

// Formats 22 and 23, as every operation tests for them.
constexpr bool is_dense_format(std::int32_t format) { return (format & ~1) == SM_FORMAT_COLUMNS; }

inline bool is_symmetric_sparse(const SmMatrix& m) {
  return m.kind == SM_KIND_SYMMETRIC && m.format == SM_FORMAT_SPARSE;
}
inline bool is_general_sparse(const SmMatrix& m) { return m.kind == SM_KIND_GENERAL && m.format == SM_FORMAT_SPARSE; }
// Values in one array: dense of any kind, and diagonal.
inline bool has_value_array(const SmMatrix& m) {
  return m.kind == SM_KIND_DIAGONAL ||
         ((m.kind == SM_KIND_GENERAL || m.kind == SM_KIND_SYMMETRIC) && is_dense_format(m.format));
}

// A full array, by columns (row_step 1) or by rows (col_step 1).
struct FullLayout {
  i64 row_step, col_step;

  static FullLayout of(const SmMatrix& m) {
    return m.format == SM_FORMAT_ROWS ? FullLayout{m.cols, 1} : FullLayout{1, m.rows};
  }
  // Position of (r, c), both not negative; false when it is beyond every array.
  bool at(i64 r, i64 c, i64& position) const {
    i64 down = 0;
    i64 across = 0;
    return !__builtin_mul_overflow(r, row_step, &down) && !__builtin_mul_overflow(c, col_step, &across) &&
           !__builtin_add_overflow(down, across, &position);
  }
};

// The upper triangle by columns: column c holds rows 0 .. c.
struct PackedColumns {
  i64 n;
  i64 at(i64 r, i64 c) const { return r + c * (c + 1) / 2; }
  i64 diagonal(i64 k) const { return at(k, k); }
};

// The upper triangle by rows: row r holds columns r .. n-1.
struct PackedRows {
  i64 n;
  i64 at(i64 r, i64 c) const { return ((2 * n - r + 1) * r) / 2 - r + c; }
  i64 diagonal(i64 k) const { return at(k, k); }
};

// Calls f with the packed layout of a format.
template <class F>
decltype(auto) with_packed(std::int32_t format, i64 n, F&& f) {
  return format == SM_FORMAT_ROWS ? f(PackedRows{n}) : f(PackedColumns{n});
}

}  // namespace sm
