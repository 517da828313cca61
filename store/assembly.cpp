// Single elements: entering, reading, overwriting, weighted outer products.
#include <algorithm>

#include "store/checks.hpp"
#include "store/nodes.hpp"
#include "store/operations.hpp"

namespace sm {

namespace {

SmStatus put(SmMatrix& m, i64 position, bool add, double value) {
  if (position >= static_cast<i64>(m.value_count)) return SM_BAD_ARGUMENT;
  drop_separate_factor(m);
  double& slot = m.values[position];
  slot = add ? slot + value : value;
  return SM_OK;
}

SmStatus assign_general(SmMatrix& m, i64 row, i64 col, bool add, double value) {
  if (m.format == SM_FORMAT_SPARSE) return enter_node(m, row, col, add, value);
  if (!is_dense_format(m.format)) return SM_UNAVAILABLE;
  // The position is what is checked, not the indices: a row past the end of a column is the next column's.
  i64 position = 0;
  if (!FullLayout::of(m).at(row, col, position)) return SM_BAD_ARGUMENT;
  return put(m, position, add, value);
}

SmStatus assign_symmetric(SmMatrix& m, i64 row, i64 col, bool add, double value) {
  if (col < row) return SM_OUTSIDE;
  if (m.format == SM_FORMAT_SPARSE) {
    return m.state == SM_STATE_OPEN ? enter_node(m, row, col, add, value) : SM_ALREADY_CLOSED;
  }
  if (row >= m.rows || col >= m.cols) return SM_BAD_ARGUMENT;
  if (!is_dense_format(m.format)) return SM_UNAVAILABLE;
  if (m.value_count < 1.0) return SM_BAD_ARGUMENT;  // the size stays after a refused allocation, without bounds
  const i64 position = with_packed(m.format, m.rows, [&](auto layout) { return layout.at(row, col); });
  return put(m, position, add, value);
}

SmStatus assign_diagonal(SmMatrix& m, i64 row, i64 col, bool add, double value) {
  if (row >= m.rows || col >= m.cols || row != col) return SM_BAD_ARGUMENT;
  return put(m, row, add, value);
}

SmStatus assign_by_kind(SmMatrix& m, i64 row, i64 col, bool add, double value) {
  switch (m.kind) {
    case SM_KIND_GENERAL:
      return assign_general(m, row, col, add, value);
    case SM_KIND_SYMMETRIC:
      return assign_symmetric(m, row, col, add, value);
    case SM_KIND_DIAGONAL:
      return assign_diagonal(m, row, col, add, value);
    default:
      return SM_UNAVAILABLE;
  }
}

// Binary search in the compressed row; the diagonal stands first in every row.
double find_in_row(const SmMatrix& m, i64 row, i64 col) {
  const i64* first = m.col_index + m.row_start[row];
  const i64* last = m.col_index + m.row_start[row + 1];
  const double* values = m.nz_values + m.row_start[row];
  if (first == last) return 0.0;
  if (row == col) return values[0];
  const i64* hit = std::lower_bound(first, last, col);
  return hit != last && *hit == col ? values[hit - first] : 0.0;
}

SmStatus get_general(SmMatrix& m, i64 row, i64 col, double& value) {
  if (m.format == SM_FORMAT_SPARSE) {
    const NonzeroNode* node = m.tree->find(m.tree, m.row_roots + row, &col);
    value = node ? node->value : 0.0;
    return SM_OK;
  }
  if (!is_dense_format(m.format)) return SM_BAD_FORMAT;
  const FullLayout layout = FullLayout::of(m);
  value = m.values[row * layout.row_step + col * layout.col_step];
  return SM_OK;
}

SmStatus get_symmetric(SmMatrix& m, i64 row, i64 col, double& value) {
  if (m.format == SM_FORMAT_SPARSE) {
    if ((m.state > SM_STATE_CLOSED && row != col) || col < row) return SM_NO_ELEMENT;
    value = find_in_row(m, row, col);
    return SM_OK;
  }
  // Below the diagonal the formulas lead to some other element of the triangle, which is what is read.
  value = m.values[with_packed(m.format, m.rows, [&](auto layout) { return layout.at(row, col); })];
  return SM_OK;
}

// Pairs are entered from the upper triangle, whichever way round the indices come.
SmStatus add_pair(SmMatrix& m, const i64* index, i64 i, i64 j, double value) {
  const i64 row = index ? std::min(index[i], index[j]) : i;
  const i64 col = index ? std::max(index[i], index[j]) : j;
  return assign(m, row, col, true, value);
}

// An entry that is served without a second look: inside an open symmetric sparse matrix with room.
inline bool is_plain_entry(const SmMatrix& m, i64 row, i64 col) {
  return is_symmetric_sparse(m) && m.state == SM_STATE_OPEN && 0 <= row && row <= col && col < m.rows && m.tree &&
         m.spare_node && m.sym_roots && m.nnz < SM_MAX_ELEMENTS - kMostWaiting;
}

[[gnu::noinline]] SmStatus assign_any(SmMatrix& m, i64 row, i64 col, bool add, double value) {
  if (m.rows < 1) return SM_OK;
  if (m.kind == SM_KIND_NONE) return SM_UNTYPED;
  if (row < 0 || col < 0) return SM_BAD_ARGUMENT;
  SM_TRY(assign_by_kind(m, row, col, add, value));
  void_results(m);
  return SM_OK;
}

}  // namespace

SmStatus assign(SmMatrix& m, i64 row, i64 col, bool add, double value) {
  if (!is_plain_entry(m, row, col)) return assign_any(m, row, col, add, value);
  OpenRows& open = open_rows(m);
  // In random order the row's diagonal is as far away as its root word, and is wanted right after it.
  __builtin_prefetch(open.diagonal + row);
  SM_TRY(--open.waiting.until < 0 ? enter_or_wait(m, {row, col, value, add})
                                  : enter_covered(m, m.sym_roots + row, col, add, value));
  void_results(m);
  return SM_OK;
}

SmStatus get(SmMatrix& m, i64 row, i64 col, double& value) {
  value = 0.0;
  if (m.nnz < 1) return SM_NO_ELEMENT;
  value = missing();
  if (m.kind == SM_KIND_NONE) return SM_KIND_MISMATCH;
  if (!is_closed(m)) return SM_NOT_CLOSED;
  if (row < 0 || row >= m.rows || col < 0 || col >= m.cols) return SM_OUTSIDE;
  switch (m.kind) {
    case SM_KIND_GENERAL:
      return get_general(m, row, col, value);
    case SM_KIND_SYMMETRIC:
      return get_symmetric(m, row, col, value);
    case SM_KIND_DIAGONAL:
      value = m.values[row];
      return SM_OK;
    default:
      return SM_NO_ELEMENT;
  }
}

SmStatus set_all(SmMatrix& m, double value) {
  if (m.nnz < 1) return SM_OK;
  if (m.kind == SM_KIND_NONE) return SM_KIND_MISMATCH;
  if (!is_closed(m)) return SM_NOT_CLOSED;
  if (is_general_sparse(m)) {
    for_each_node(m, [&](i64, NonzeroNode& node) { node.value = value; });
  } else if (is_symmetric_sparse(m)) {
    std::fill_n(m.nz_values, m.nnz, value);
    if (m.state == SM_STATE_FACTORED) m.state = SM_STATE_SYMBOLIC;
  } else if (has_value_array(m)) {
    drop_separate_factor(m);
    std::fill_n(m.values, static_cast<i64>(m.value_count), value);
  } else {
    return SM_UNAVAILABLE;
  }
  void_results(m);
  return SM_OK;
}

SmStatus add_outer(SmMatrix& m, const double* z, const i64* index, i64 length, double weight) {
  if (m.nnz < 1) return SM_OK;
  if (length > m.rows || (!z && length > 0)) return SM_BAD_ARGUMENT;
  if (m.kind != SM_KIND_SYMMETRIC) return SM_UNAVAILABLE;
  if (is_symmetric_sparse(m) && m.state != SM_STATE_OPEN) return SM_ALREADY_CLOSED;
  for (i64 i = 0; i < length; ++i) {
    if (!index && z[i] == 0.0) continue;
    for (i64 j = i; j < length; ++j) {
      if (!index && z[j] == 0.0) continue;
      const double product = z[j] * z[i];
      SM_TRY(add_pair(m, index, i, j, weight == 1.0 ? product : product * weight));
    }
  }
  return SM_OK;
}

SmStatus remove(SmMatrix& m, i64 row, i64 col) {
  if (m.nnz < 1) return SM_OK;
  if (m.kind == SM_KIND_NONE) return SM_UNTYPED;
  if (row < 0 || row >= m.rows || col < 0 || col >= m.cols) return SM_OUTSIDE;
  if (!is_general_sparse(m)) return SM_UNAVAILABLE;
  unlink_node(m, row, col);
  return SM_OK;
}

}  // namespace sm
