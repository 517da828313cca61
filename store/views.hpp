// The storage of a closed matrix as a view: it knows where elements live and walks the stored ones. An operation is
// written once, as a template over views, and visit() picks the view by kind and format.
//
//   view          serves                        one_triangle  a stored row holds
//   TreeRows      general, 21                   no            its nodes, columns ascending
//   FullArray     general, 22 and 23            no            every column
//   UpperRows     symmetric, 21                 yes           columns ascending from the diagonal on; once reordered
//                                                             (not is_ascending) the diagonal first, then the others
//                                                             in no order, (i, j) standing for the pair whichever
//                                                             index is larger
//   Packed<L>     symmetric, 22 and 23          yes           columns i .. n-1
//   DiagonalArray diagonal                      no            column i
//
// one_triangle: every pair (i, j), i != j, is stored once and stands for (j, i) too.
//
// Each view has rows, cols;
//   row(i, f)      f(j, value) for the stored entries of row i, in the order of the table
//   line(k, f)     f(i, j, value) for the stored entries of the k-th of lines() lines in storage: a column where
//                  columns are stored, else a row
//   entries(f)     f(i, j, value) for every stored entry, in storage order
//   any(f)         whether f(i, j, value) holds for one of them; lines after the first that has one are not looked at
//   find(i, j)     the address of the stored element, or null; one_triangle views want i <= j, and UpperRows rows that
//                  have not been reordered
//   diagonal(i)    the address of the stored element (i, i), or null; in any order of the rows
// Values are passed as double&, so that the same walk reads and writes.
#pragma once

#include <algorithm>

#include "store/nodes.hpp"

namespace sm {

template <class View>
struct StoredLines {
  template <class F>
  void entries(F&& f) const {
    const auto& view = static_cast<const View&>(*this);
    for (i64 k = 0; k < view.lines(); ++k) view.line(k, f);
  }
  template <class F>
  bool any(F&& f) const {
    const auto& view = static_cast<const View&>(*this);
    bool found = false;
    for (i64 k = 0; k < view.lines() && !found; ++k) {
      view.line(k, [&](i64 i, i64 j, double& v) { found = found || f(i, j, v); });
    }
    return found;
  }
};

struct TreeRows : StoredLines<TreeRows> {
  static constexpr bool one_triangle = false;
  SmMatrix& m;
  i64 rows, cols;

  explicit TreeRows(SmMatrix& matrix) : m(matrix), rows(matrix.rows), cols(matrix.cols) {}

  template <class F>
  void row(i64 i, F&& f) const {
    for (NonzeroNode* node = first_node(m, i); node; node = sm_node_next(node)) f(node->key, node->value);
  }
  i64 lines() const { return rows; }
  template <class F>
  void line(i64 i, F&& f) const {
    row(i, [&](i64 j, double& v) { f(i, j, v); });
  }
  double* find(i64 i, i64 j) const {
    uint64_t* root = m.row_roots ? m.row_roots + i : nullptr;
    NonzeroNode* node = root && *root && m.tree ? m.tree->find(m.tree, root, &j) : nullptr;
    return node ? &node->value : nullptr;
  }
  double* diagonal(i64 i) const { return find(i, i); }
};

struct FullArray : StoredLines<FullArray> {
  static constexpr bool one_triangle = false;
  double* values;
  i64 rows, cols;
  FullLayout layout;

  explicit FullArray(SmMatrix& m) : values(m.values), rows(m.rows), cols(m.cols), layout(FullLayout::of(m)) {}

  double* find(i64 i, i64 j) const { return values + i * layout.row_step + j * layout.col_step; }
  double* diagonal(i64 i) const { return find(i, i); }
  template <class F>
  void row(i64 i, F&& f) const {
    for (i64 j = 0; j < cols; ++j) f(j, *find(i, j));
  }
  i64 lines() const { return layout.col_step == 1 ? rows : cols; }
  template <class F>
  void line(i64 k, F&& f) const {
    if (layout.col_step == 1) {
      for (i64 j = 0; j < cols; ++j) f(k, j, *find(k, j));
    } else {
      for (i64 i = 0; i < rows; ++i) f(i, k, *find(i, k));
    }
  }
};

struct UpperRows : StoredLines<UpperRows> {
  static constexpr bool one_triangle = true;
  const i64* row_start;
  const i64* col_index;
  double* values;
  i64 rows, cols;
  bool is_ascending;

  explicit UpperRows(SmMatrix& m)
      : row_start(m.row_start),
        col_index(m.col_index),
        values(m.nz_values),
        rows(m.rows),
        cols(m.cols),
        is_ascending(m.state < SM_STATE_REORDERED) {}

  template <class F>
  void row(i64 i, F&& f) const {
    for (i64 p = row_start[i]; p < row_start[i + 1]; ++p) f(col_index[p], values[p]);
  }
  // f(j, value) for the stored entries of row i with first <= j <= last. Columns that ascend are searched for the first
  // one and left behind the last; in a reordered row every one is looked at.
  template <class F>
  void row_between(i64 i, i64 first, i64 last, F&& f) const {
    if (is_ascending) {
      const i64 end = row_start[i + 1];
      i64 p = std::lower_bound(col_index + row_start[i], col_index + end, first) - col_index;
      for (; p < end && col_index[p] <= last; ++p) f(col_index[p], values[p]);
    } else {
      row(i, [&](i64 j, double& v) {
        if (first <= j && j <= last) f(j, v);
      });
    }
  }
  i64 lines() const { return rows; }
  template <class F>
  void line(i64 i, F&& f) const {
    row(i, [&](i64 j, double& v) { f(i, j, v); });
  }
  double* find(i64 i, i64 j) const {
    const i64* first = col_index + row_start[i];
    const i64* last = col_index + row_start[i + 1];
    const i64* hit = std::lower_bound(first, last, j);
    return hit != last && *hit == j ? values + (hit - col_index) : nullptr;
  }
  double* diagonal(i64 i) const { return values + row_start[i]; }
};

template <class Layout>
struct Packed : StoredLines<Packed<Layout>> {
  static constexpr bool one_triangle = true;
  static constexpr bool by_columns = std::is_same_v<Layout, PackedColumns>;
  double* values;
  i64 rows, cols;
  Layout layout;

  Packed(double* array, i64 n) : values(array), rows(n), cols(n), layout{n} {}

  double* find(i64 i, i64 j) const { return values + layout.at(i, j); }
  double* diagonal(i64 i) const { return values + layout.diagonal(i); }
  template <class F>
  void row(i64 i, F&& f) const {
    for (i64 j = i; j < cols; ++j) f(j, *find(i, j));
  }
  i64 lines() const { return rows; }
  template <class F>
  void line(i64 k, F&& f) const {
    if constexpr (by_columns) {
      for (i64 i = 0; i <= k; ++i) f(i, k, *find(i, k));
    } else {
      for (i64 j = k; j < cols; ++j) f(k, j, *find(k, j));
    }
  }
};

struct DiagonalArray : StoredLines<DiagonalArray> {
  static constexpr bool one_triangle = false;
  double* values;
  i64 rows, cols;

  explicit DiagonalArray(SmMatrix& m) : values(m.values), rows(m.rows), cols(m.cols) {}

  double* find(i64 i, i64 j) const { return i == j ? values + i : nullptr; }
  double* diagonal(i64 i) const { return values + i; }
  template <class F>
  void row(i64 i, F&& f) const {
    f(i, values[i]);
  }
  i64 lines() const { return rows; }
  template <class F>
  void line(i64 i, F&& f) const {
    f(i, i, values[i]);
  }
};

// Calls f(view) -> SmStatus for the matrix's kind and format, and answers what it answers; `otherwise` for a format
// that the kind does not know, 124 for another kind. The matrix must be readable (is_closed) and not empty.
template <class F>
SmStatus visit(SmMatrix& m, F&& f, SmStatus otherwise = SM_UNAVAILABLE) {
  const bool sparse = m.format == SM_FORMAT_SPARSE;
  switch (m.kind) {
    case SM_KIND_GENERAL:
      if (sparse) return f(TreeRows(m));
      return is_dense_format(m.format) ? f(FullArray(m)) : otherwise;
    case SM_KIND_SYMMETRIC:
      if (sparse) return f(UpperRows(m));
      if (!is_dense_format(m.format)) return otherwise;
      if (m.format == SM_FORMAT_ROWS) return f(Packed<PackedRows>(m.values, m.rows));
      return f(Packed<PackedColumns>(m.values, m.rows));
    case SM_KIND_DIAGONAL:
      return f(DiagonalArray(m));
    default:
      return SM_UNAVAILABLE;
  }
}

}  // namespace sm
