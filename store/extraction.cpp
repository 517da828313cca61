// Reading a closed matrix into arrays: rows, blocks, the diagonal, the whole matrix. Outputs are cleared first and
// receive stored values only, so that absent entries read as 0.
//
//                 general 21, 22, 23   symmetric 21        symmetric 22, 23   diagonal
//   row           yes                  up to state 2, 118  yes                yes
//   upper_row     124                  up to state 2, 118  124, yes           124
//   upper_block   124                  up to state 2, 118  124                124
//   diagonal      yes                  yes                 yes                yes
//   dense         mode 2               modes 0, 1, 2       modes 0, 1, 2      modes 0, 1, 2
//   is_diagonal   yes                  yes                 yes                always
#include <algorithm>
#include <cmath>

#include "store/checks.hpp"
#include "store/operations.hpp"
#include "store/views.hpp"

namespace sm {

namespace {

// From state 3 on the stored rows are the factor's, and a row of the caller's is not to be had from them.
bool is_reordered(const SmMatrix& m) { return is_symmetric_sparse(m) && m.state > SM_STATE_ORDERED; }

// Columns from `start` on; where one triangle is stored, what lies right of the diagonal always.
template <class View>
void fill_row(const View& view, i64 row, double* out, i64 start) {
  if constexpr (View::one_triangle) {
    for (i64 j = start; j < row; ++j) {
      if (const double* v = view.find(j, row)) out[j] = *v;
    }
    start = row;
  }
  view.row(row, [&](i64 j, double v) {
    if (j >= start) out[j] = v;
  });
}

// The only element of a row is there whatever the start.
void fill_row(const DiagonalArray& view, i64 row, double* out, i64) { out[row] = view.values[row]; }

// Two layouts keep the part of a row from `start` on in one block, and that block lands at the beginning of `out`, not
// at its own columns. Callers know it, so it stays: where the block ends, or 0 for the layouts that do not move it.
i64 moved_block_end(const SmMatrix& m, i64 row) {
  if (m.kind == SM_KIND_GENERAL && m.format == SM_FORMAT_ROWS) return m.cols;
  if (m.kind == SM_KIND_SYMMETRIC && m.format == SM_FORMAT_COLUMNS) return row + 1;
  return 0;
}

void move_to_front(double* out, i64 start, i64 end) {
  start = std::min(start, end);
  std::copy(out + start, out + end, out);
  std::fill(out + end - start, out + end, 0.0);
}

Gate may_read_upper_row(const SmMatrix& m, i64 row) {
  SM_STOP_IF(m.kind != SM_KIND_SYMMETRIC, SM_UNAVAILABLE);
  SM_STOP_IF(is_reordered(m), SM_REORDERED);
  SM_STOP_IF(m.format != SM_FORMAT_SPARSE && m.format != SM_FORMAT_ROWS, SM_UNAVAILABLE);
  SM_STOP_IF(row < 0 || row >= m.cols, SM_OUTSIDE);
  return {};
}

bool is_outside(i64 index, i64 n) { return index < 0 || index >= n; }

Gate may_read_upper_block(const SmMatrix& m, i64 r0, i64 r1, i64 c0, i64 c1) {
  SM_STOP_IF(!is_symmetric_sparse(m), SM_UNAVAILABLE);
  SM_STOP_IF(is_reordered(m), SM_REORDERED);
  SM_STOP_IF(is_outside(r0, m.rows) || is_outside(r1, m.rows), SM_OUTSIDE);
  SM_STOP_IF(is_outside(c0, m.rows) || is_outside(c1, m.rows), SM_OUTSIDE);
  SM_STOP_IF(r0 > r1 || c0 > c1 || c0 < r0, SM_OUTSIDE);
  return {};
}

// Last index minus first plus one; 0 when there is nothing between them, or more than any array holds.
i64 extent(i64 first, i64 last) {
  i64 count = 0;
  if (first > last || __builtin_sub_overflow(last, first, &count) || count >= SM_MAX_ELEMENTS) return 0;
  return count + 1;
}

i64 block_size(i64 r0, i64 r1, i64 c0, i64 c1) {
  i64 size = 0;
  const bool overflows = __builtin_mul_overflow(extent(r0, r1), extent(c0, c1), &size);
  return overflows || size > SM_MAX_ELEMENTS ? 0 : size;
}

// Entries of the block, each also at its mirrored place when its row is one of the block's columns. That place counts
// from the corner (c0, r0), which is the block's own corner only when r0 == c0; it may lie behind the block, and may
// then share its place with another entry: the later one stays.
void fill_upper_block(const UpperRows& view, double* out, i64 r0, i64 r1, i64 c0, i64 c1) {
  const i64 width = extent(c0, c1);
  const i64 size = block_size(r0, r1, c0, c1);
  for (i64 i = r0; i <= r1; ++i) {
    view.row_between(i, c0, c1, [&](i64 j, double v) {
      out[(i - r0) * width + (j - c0)] = v;
      const i64 mirrored = (j - c0) * width + (i - r0);
      if (i >= c0 && j > i && mirrored < size) out[mirrored] = v;
    });
  }
}

Gate may_read_diagonal(const SmMatrix& m, i64 first, i64 last) {
  const i64 length = std::min(m.rows, m.cols);
  SM_STOP_IF(is_outside(first, length) || is_outside(last, length) || last < first, SM_OUTSIDE);
  return {};
}

// Modes of a dense copy: the two packed orders, and the full array by rows.
constexpr std::int16_t kPackedColumns = 0;
constexpr std::int16_t kPackedRows = 1;
constexpr std::int16_t kFull = 2;

SmStatus clear_dense(const SmMatrix& m, double* out, std::int16_t mode) {
  const double count = mode == kFull ? static_cast<double>(m.rows) * static_cast<double>(m.cols) : m.value_count;
  if (count > static_cast<double>(SM_MAX_ELEMENTS)) return SM_TOO_LARGE;
  std::fill_n(out, static_cast<i64>(count), 0.0);
  return SM_OK;
}

template <class View>
void fill_full(const View& view, double* out) {
  view.entries([&](i64 i, i64 j, double v) {
    out[i * view.cols + j] = v;
    if (View::one_triangle) out[j * view.cols + i] = v;
  });
}

template <class View>
SmStatus fill_packed(const View& view, double* out, std::int16_t mode) {
  if constexpr (!View::one_triangle) return SM_UNAVAILABLE;
  with_packed(mode == kPackedRows ? SM_FORMAT_ROWS : SM_FORMAT_COLUMNS, view.rows, [&](auto layout) {
    view.entries([&](i64 i, i64 j, double v) { out[layout.at(std::min(i, j), std::max(i, j))] = v; });
  });
  return SM_OK;
}

SmStatus fill_packed(const DiagonalArray& view, double* out, std::int16_t) {
  std::copy_n(view.values, view.rows, out);
  return SM_OK;
}

}  // namespace

SmStatus row(SmMatrix& m, i64 row, double* out, i64 start) {
  SM_PASS(may_read(m));
  if (is_outside(row, m.rows)) return SM_OUTSIDE;
  std::fill_n(out, m.cols, 0.0);
  if (is_reordered(m)) return SM_REORDERED;
  start = std::max<i64>(start, 0);
  const auto fill = [&](const auto& view) {
    fill_row(view, row, out, start);
    return SM_OK;
  };
  SM_TRY(visit(m, fill, m.kind == SM_KIND_SYMMETRIC ? SM_OK : SM_UNAVAILABLE));
  move_to_front(out, start, moved_block_end(m, row));
  return SM_OK;
}

SmStatus upper_row(SmMatrix& m, i64 row, double* out) {
  SM_PASS(may_read(m));
  std::fill_n(out, m.cols, 0.0);
  SM_PASS(may_read_upper_row(m, row));
  return visit(m, [&](const auto& view) {
    view.row(row, [&](i64 j, double v) { out[j] = v; });
    return SM_OK;
  });
}

SmStatus upper_block(SmMatrix& m, double* out, i64 r0, i64 r1, i64 c0, i64 c1) {
  std::fill_n(out, block_size(r0, r1, c0, c1), 0.0);  // before any check, the one for an empty matrix included
  SM_PASS(may_read(m));
  SM_PASS(may_read_upper_block(m, r0, r1, c0, c1));
  fill_upper_block(UpperRows(m), out, r0, r1, c0, c1);
  return SM_OK;
}

SmStatus diagonal(SmMatrix& m, double* out, i64 first, i64 last) {
  SM_PASS(may_read(m));
  SM_PASS(may_read_diagonal(m, first, last));
  std::fill_n(out, last - first + 1, 0.0);
  return visit(m, [&](const auto& view) {
    for (i64 i = first; i <= last; ++i) {
      if (const double* v = view.diagonal(i)) out[i - first] = *v;
    }
    return SM_OK;
  });
}

SmStatus dense(SmMatrix& m, double* out, std::int16_t mode) {
  SM_PASS(may_read(m));
  SM_TRY(clear_dense(m, out, mode));
  if (mode < kPackedColumns || mode > kFull) return SM_UNAVAILABLE;
  return visit(m, [&](const auto& view) -> SmStatus {
    if (mode != kFull) return fill_packed(view, out, mode);
    fill_full(view, out);
    return SM_OK;
  });
}

SmStatus is_diagonal(SmMatrix& m, std::int16_t& flag, double tolerance) {
  flag = 0;
  if (m.nnz < 1) return SM_OK;
  if (m.kind == SM_KIND_DIAGONAL) {
    flag = 1;
    return SM_OK;
  }
  if (m.kind == SM_KIND_NONE) return SM_KIND_MISMATCH;
  if (!is_closed(m)) return SM_NOT_CLOSED;
  if (m.rows != m.cols) return SM_DIMENSION_MISMATCH;
  if (std::isnan(tolerance)) tolerance = 0.0;
  // A kind or format without a view has no elements to look at, and the flag stays 0.
  (void)visit(m, [&](const auto& view) {
    flag = !view.any([&](i64 i, i64 j, double v) { return i != j && std::fabs(v) > tolerance; });
    return SM_OK;
  });
  return SM_OK;
}

}  // namespace sm
