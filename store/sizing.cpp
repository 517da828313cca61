// Sizes: value arrays, roots and slabs, the zero diagonal of a symmetric sparse matrix, and arrays on loan.
#include <algorithm>

#include "cholesky/reorder.hpp"
#include "store/checks.hpp"
#include "store/nodes.hpp"
#include "store/operations.hpp"

namespace sm {

namespace {

constexpr i64 kLeastRoots = 20;
constexpr i64 kRowsPerSlabNode = 20;
constexpr i64 kManyRows = 50'000;  // from here on a symmetric matrix takes slabs of a fixed size
constexpr i64 kLargeSlab = 1'000'000;

double triangle(i64 n) { return (static_cast<double>(n) + 1.0) * 0.5 * static_cast<double>(n); }

// Lets go of the value array: an owned one goes back, a caller's is only forgotten.
void detach_values(SmMatrix& m) {
  if (m.owns_values) give_back(m.pool, m.values);
  m.values = nullptr;
  m.col_index = nullptr;  // and with it the ownership flag
  m.nnz = 0;
}

SmStatus take_values(SmMatrix& m, i64 count) {
  SM_TRY(need_pool(m));
  SM_TRY(allocate(m.pool, count, Fill::zero, m.values));
  m.owns_values = 1;
  m.nnz = count;
  return SM_OK;
}

// `count` is exact below 2^53; what is larger is refused with `refusal` before it is used as an integer.
SmStatus size_values(SmMatrix& m, i64 rows, i64 cols, double count, SmStatus refusal) {
  m.state = SM_STATE_CLOSED;
  give_back(m.pool, m.dense_factor);
  const bool same = rows == m.rows && cols == m.cols && (m.values || rows == 0);
  m.rows = rows;
  m.cols = cols;
  m.value_count = count;
  if (same) {
    std::fill_n(m.values, m.nnz, 0.0);
    return SM_OK;
  }
  detach_values(m);
  const SmStatus status =
      count > static_cast<double>(SM_MAX_ELEMENTS) ? refusal : take_values(m, static_cast<i64>(count));
  if (status != SM_OK) m.value_count = 0.0;
  return status;
}

SmStatus size_general_trees(SmMatrix& m, i64 rows, i64 cols) {
  m.state = SM_STATE_CLOSED;
  m.nnz = 0;
  m.rows = rows;
  m.cols = cols;
  m.value_count = static_cast<double>(rows) * static_cast<double>(cols);
  m.row_capacity = rows == 0 ? 0 : std::max(rows, kLeastRoots);
  destroy_pool(m.pool);
  m.spare_node = m.next_node = nullptr;
  m.row_roots = nullptr;
  if (rows < 1) return SM_OK;
  if (m.row_capacity > SM_MAX_ELEMENTS / kRowsPerSlabNode) return SM_TOO_LARGE;
  SM_TRY(need_pool(m));
  return start_trees(m, m.row_capacity * kRowsPerSlabNode);
}

void drop_symmetric_storage(SmMatrix& m) {
  destroy_pool(m.assembly_pool);
  give_back(m.pool, m.row_start);
  give_back(m.pool, m.col_index);
  give_back(m.pool, m.nz_values);
  give_back(m.pool, m.perm);
  give_back(m.pool, m.inv_perm);
  give_back(m.pool, m.work);
  give_back(m.pool, m.factor_reserved);
  m.factor_scratch = m.factor_iju = m.factor_iu = m.factor_ju = nullptr;
  m.factor_diag = m.factor_values = nullptr;
  m.work_capacity = 0;
  m.sym_roots = nullptr;
  m.spare_node = m.next_node = nullptr;
  m.nnz = 0;
}

SmStatus size_symmetric_trees(SmMatrix& m, i64 n) {
  drop_symmetric_storage(m);
  m.state = SM_STATE_OPEN;
  m.rows = m.cols = n;
  m.value_count = triangle(n);
  m.row_capacity = n == 0 ? 0 : std::max(n, kLeastRoots);
  if (n == 0) return SM_OK;
  if (m.row_capacity > SM_MAX_ELEMENTS) return SM_TOO_LARGE;
  m.assembly_pool = create_pool(SM_POOL_MATRIX, nullptr, nullptr);
  if (!m.assembly_pool) return SM_NO_MEMORY;
  SM_TRY(start_trees(m, m.row_capacity >= kManyRows ? kLargeSlab : m.row_capacity * kRowsPerSlabNode));
  return m.tree ? seed_diagonal(m) : SM_NO_MEMORY;
}

SmStatus resize_symmetric(SmMatrix& m, i64 rows, i64 cols) {
  if (rows != cols) {
    // The state is 1 from here on, which promises rows in the caller's order.
    if (is_symmetric_sparse(m) && m.state >= SM_STATE_REORDERED) restore_order(m);
    m.state = SM_STATE_CLOSED;
    return SM_NOT_SQUARE;
  }
  if (m.format == SM_FORMAT_SPARSE) return size_symmetric_trees(m, rows);
  return size_values(m, rows, rows, triangle(rows), SM_TOO_LARGE);
}

SmStatus resize_diagonal(SmMatrix& m, i64 rows, i64 cols) {
  m.state = SM_STATE_CLOSED;
  if (rows != cols) return SM_NOT_SQUARE;
  return size_values(m, rows, rows, static_cast<double>(rows), SM_NO_MEMORY);
}

// Values that a tied array of this shape holds, or why there is no such shape.
SmStatus tied_count(i64 rows, i64 cols, std::int32_t kind, std::int32_t format, i64& count) {
  if (kind != SM_KIND_GENERAL && kind != SM_KIND_SYMMETRIC && kind != SM_KIND_DIAGONAL) return SM_UNAVAILABLE;
  if (kind != SM_KIND_GENERAL && rows != cols) return SM_NOT_SQUARE;
  if (!is_dense_format(format)) return SM_UNAVAILABLE;
  const double exact = kind == SM_KIND_GENERAL     ? static_cast<double>(rows) * static_cast<double>(cols)
                       : kind == SM_KIND_SYMMETRIC ? triangle(rows)
                                                   : static_cast<double>(rows);
  if (exact > static_cast<double>(SM_MAX_ELEMENTS)) return SM_TOO_LARGE;
  count = static_cast<i64>(exact);
  return SM_OK;
}

}  // namespace

SmStatus resize(SmMatrix& m, i64 rows, i64 cols) {
  if (m.kind == SM_KIND_NONE) return SM_UNTYPED;
  if (rows < 0 || cols < 0 || (rows == 0) != (cols == 0)) return SM_BAD_SIZE;
  void_results(m);
  m.definite = -1;
  switch (m.kind) {
    case SM_KIND_GENERAL:
      if (m.format == SM_FORMAT_SPARSE) return size_general_trees(m, rows, cols);
      return size_values(m, rows, cols, static_cast<double>(rows) * static_cast<double>(cols), SM_TOO_LARGE);
    case SM_KIND_SYMMETRIC:
      return resize_symmetric(m, rows, cols);
    case SM_KIND_DIAGONAL:
      return resize_diagonal(m, rows, cols);
    default:
      m.state = SM_STATE_CLOSED;
      return SM_UNAVAILABLE;
  }
}

SmStatus tie(SmMatrix& m, double* data, i64 rows, i64 cols, std::int32_t kind, std::int32_t format) {
  if (!data && (rows > 0 || cols >= 1)) return SM_BAD_ARGUMENT;
  if (rows < 0 || cols < 0) return SM_BAD_ARGUMENT;
  (void)resize(m, 0, 0);  // a reset record answers 1 and has nothing to drop
  i64 count = 0;
  SM_TRY(tied_count(rows, cols, kind, format, count));
  m.values = data;
  m.row_start = nullptr;
  m.col_index = nullptr;  // ownership flag 0
  m.rows = rows;
  m.cols = cols;
  m.nnz = count;
  m.value_count = static_cast<double>(count);
  m.kind = kind;
  m.format = format;
  // A reset record left the registry; back in it, it is found when the instance is destroyed.
  if (m.instance && m.registry_index > 0) m.instance->registry[m.registry_index - 1] = &m;
  return SM_OK;
}

}  // namespace sm
