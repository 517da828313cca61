// The storage of a closed matrix as a view: it knows where elements live and walks the stored ones. An operation is written
// once, as a template over views, and visit() picks the view by kind and format.
//
//   view          serves                        one_triangle  a stored row holds
//   TreeRows      general, 21                   no            its nodes, columns ascending
//   FullArray     general, 22 and 23            no            every column
//   UpperRows     symmetric, 21                 yes           columns ascending from the diagonal on; once reordered, the
//                                                             diagonal first and then the others in no order, (i, j) standing
//                                                             for the pair whichever index is larger
//   Packed<L>     symmetric, 22 and 23          yes           columns i .. n-1
//   DiagonalArray diagonal                      no            column i
//
// one_triangle: every pair (i, j), i != j, is stored once and stands for (j, i) too.
//
// Each view has rows, cols;
//   row(i, f)      f(j, value) for the stored entries of row i, in the order of the table
//   entries(f)     f(i, j, value) for every stored entry, in storage order
//   find(i, j)     the address of the stored element, or null; one_triangle views want i <= j, and UpperRows rows that have
//                  not been reordered
// Values are passed as double&, so that the same walk reads and writes.
#pragma once

#include <algorithm>

#include "store/nodes.hpp"

namespace sm {

struct TreeRows {
  static constexpr bool one_triangle = false;
  SmMatrix& m;
  i64 rows, cols;

  explicit TreeRows(SmMatrix& matrix) : m(matrix), rows(matrix.rows), cols(matrix.cols) {}

  template <class F>
  void row(i64 i, F&& f) const {
    for (NonzeroNode* node = first_node(m, i); node; node = sm_node_next(node)) f(node->key, node->value);
  }
  template <class F>
  void entries(F&& f) const {
    for (i64 i = 0; i < rows; ++i) {
      row(i, [&](i64 j, double& v) { f(i, j, v); });
    }
  }
  double* find(i64 i, i64 j) const {
    uint64_t* root = m.row_roots ? m.row_roots + i : nullptr;
    NonzeroNode* node = root && *root && m.tree ? m.tree->find(m.tree, root, &j) : nullptr;
    return node ? &node->value : nullptr;
  }
};

struct FullArray {
  static constexpr bool one_triangle = false;
  double* values;
  i64 rows, cols;
  FullLayout layout;

  explicit FullArray(SmMatrix& m) : values(m.values), rows(m.rows), cols(m.cols), layout(FullLayout::of(m)) {}

  double* find(i64 i, i64 j) const { return values + i * layout.row_step + j * layout.col_step; }
  template <class F>
  void row(i64 i, F&& f) const {
    for (i64 j = 0; j < cols; ++j) f(j, *find(i, j));
  }
  template <class F>
  void entries(F&& f) const {
    if (layout.col_step == 1) {
      for (i64 i = 0; i < rows; ++i) {
        for (i64 j = 0; j < cols; ++j) f(i, j, *find(i, j));
      }
    } else {
      for (i64 j = 0; j < cols; ++j) {
        for (i64 i = 0; i < rows; ++i) f(i, j, *find(i, j));
      }
    }
  }
};

struct UpperRows {
  static constexpr bool one_triangle = true;
  const i64* row_start;
  const i64* col_index;
  double* values;
  i64 rows, cols;

  explicit UpperRows(SmMatrix& m)
      : row_start(m.row_start), col_index(m.col_index), values(m.nz_values), rows(m.rows), cols(m.cols) {}

  template <class F>
  void row(i64 i, F&& f) const {
    for (i64 p = row_start[i]; p < row_start[i + 1]; ++p) f(col_index[p], values[p]);
  }
  template <class F>
  void entries(F&& f) const {
    for (i64 i = 0; i < rows; ++i) {
      row(i, [&](i64 j, double& v) { f(i, j, v); });
    }
  }
  double* find(i64 i, i64 j) const {
    const i64* first = col_index + row_start[i];
    const i64* last = col_index + row_start[i + 1];
    const i64* hit = std::lower_bound(first, last, j);
    return hit != last && *hit == j ? values + (hit - col_index) : nullptr;
  }
};

template <class Layout>
struct Packed {
  static constexpr bool one_triangle = true;
  static constexpr bool by_columns = std::is_same_v<Layout, PackedColumns>;
  double* values;
  i64 rows, cols;
  Layout layout;

  Packed(double* array, i64 n) : values(array), rows(n), cols(n), layout{n} {}

  double* find(i64 i, i64 j) const { return values + layout.at(i, j); }
  template <class F>
  void row(i64 i, F&& f) const {
    for (i64 j = i; j < cols; ++j) f(j, *find(i, j));
  }
  template <class F>
  void entries(F&& f) const {
    double* v = values;  // storage order
    for (i64 k = 0; k < rows; ++k) {
      if constexpr (by_columns) {
        for (i64 i = 0; i <= k; ++i) f(i, k, *v++);
      } else {
        for (i64 j = k; j < cols; ++j) f(k, j, *v++);
      }
    }
  }
};

struct DiagonalArray {
  static constexpr bool one_triangle = false;
  double* values;
  i64 rows, cols;

  explicit DiagonalArray(SmMatrix& m) : values(m.values), rows(m.rows), cols(m.cols) {}

  double* find(i64 i, i64 j) const { return i == j ? values + i : nullptr; }
  template <class F>
  void row(i64 i, F&& f) const {
    f(i, values[i]);
  }
  template <class F>
  void entries(F&& f) const {
    for (i64 i = 0; i < rows; ++i) f(i, i, values[i]);
  }
};

// Calls f(view) -> SmStatus for the matrix's kind and format, and answers what it answers; `otherwise` for a format that the
// kind does not know, 124 for another kind. The matrix must be readable (is_closed) and not empty.
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
