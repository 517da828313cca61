// Closing: small entries go, and the trees of a symmetric matrix become compressed rows.
#include <cmath>

#include "store/checks.hpp"
#include "store/nodes.hpp"
#include "store/operations.hpp"

namespace sm {

namespace {

void drop_small_nodes(SmMatrix& m, double tolerance) {
  const bool keep_diagonal = m.kind == SM_KIND_SYMMETRIC;
  for_each_node(m, [&](i64 row, NonzeroNode& node) {
    if (!(std::fabs(node.value) <= tolerance)) return;
    if (keep_diagonal && node.key == row) {
      node.value = 0.0;
    } else {
      unlink_node(m, row, node.key);
    }
  });
}

// No branch in the body, so that it vectorises.
void drop_small_values(double* values, i64 count, double tolerance) {
  for (i64 i = 0; i < count; ++i) values[i] = std::fabs(values[i]) <= tolerance ? 0.0 : values[i];
}

// Rows that came in by growth have no diagonal until now; it would be the first node, keys being at or above the row.
i64 rows_without_diagonal(SmMatrix& m) {
  i64 count = 0;
  for (i64 row = 0; row < m.rows; ++row) {
    const NonzeroNode* node = first_node(m, row);
    if (!node || node->key != row) ++count;
  }
  return count;
}

void fill_rows(SmMatrix& m, i64* row_start, i64* col_index, double* nz_values) {
  i64 k = 0;
  for (i64 row = 0; row < m.rows; ++row) {
    const NonzeroNode* node = first_node(m, row);
    if (!node || node->key != row) col_index[k++] = row;  // its value is the 0.0 of the fresh array
    for (; node; node = sm_node_next(node)) {
      col_index[k] = node->key;
      nz_values[k++] = node->value;
    }
    row_start[row + 1] = k;
  }
}

SmStatus compress(SmMatrix& m) {
  const i64 count = m.nnz + rows_without_diagonal(m);
  Scratch<i64> row_start;
  Scratch<i64> col_index;
  Scratch<double> nz_values;
  SM_TRY(need_pool(m));
  SM_TRY(row_start.take(m.pool, m.rows + 1, Fill::zero));
  SM_TRY(col_index.take(m.pool, count, Fill::zero));
  SM_TRY(nz_values.take(m.pool, count, Fill::zero));
  fill_rows(m, row_start.data(), col_index.data(), nz_values.data());
  m.row_start = row_start.release();
  m.col_index = col_index.release();
  m.nz_values = nz_values.release();
  m.nnz = count;
  destroy_pool(m.assembly_pool);
  m.sym_roots = nullptr;
  m.spare_node = m.next_node = nullptr;
  return SM_OK;
}

}  // namespace

SmStatus close(SmMatrix& m, double tolerance) {
  if (m.nnz < 1) {
    m.state = SM_STATE_CLOSED;
    return SM_OK;
  }
  if (m.kind == SM_KIND_NONE) return SM_UNTYPED;
  if (m.state > SM_STATE_OPEN) return SM_OK;
  if (tolerance < 0.0) tolerance = m.instance->tolerances[3];
  const bool drops = !std::isnan(tolerance);
  if (is_general_sparse(m)) {
    if (drops) drop_small_nodes(m, tolerance);
  } else if (has_value_array(m)) {
    if (drops) drop_small_values(m.values, static_cast<i64>(m.value_count), tolerance);
  } else if (is_symmetric_sparse(m)) {
    if (drops) drop_small_nodes(m, tolerance);
    SM_TRY(compress(m));
  } else {
    return SM_UNAVAILABLE;
  }
  m.state = SM_STATE_CLOSED;
  return SM_OK;
}

}  // namespace sm
