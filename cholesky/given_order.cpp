// An ordering that the caller brings, and what it shares with the computed one: who may be ordered, and the workspace.
#include <algorithm>

#include "cholesky/ordering_steps.hpp"
#include "cholesky/steps.hpp"
#include "store/checks.hpp"

namespace sm {

namespace {

SmStatus next_workspace(SmMatrix& m) {
  const double limit = static_cast<double>(SM_MAX_ELEMENTS);
  if (m.work_capacity == 0) {
    const i64 words_an_entry = 4 / m.factor_block;
    const double first =
        4.0 * static_cast<double>(m.rows) + static_cast<double>(m.nnz) * static_cast<double>(words_an_entry);
    if (first > limit) return SM_TOO_LARGE;
    m.work_capacity = static_cast<i64>(first);
  }
  give_back(m.pool, m.work);
  const double capacity = static_cast<double>(m.work_capacity) + static_cast<double>(m.nnz);
  if (capacity * static_cast<double>(m.factor_block) >= limit) return SM_TOO_LARGE;
  m.work_capacity += m.nnz;
  if (m.work_capacity < 1) return SM_TOO_LARGE;  // no size that this operation set
  return allocate(m.pool, m.work_capacity, Fill::none, m.work);
}

// inverse <- the inverse of perm. False when perm names a row twice; the range of its elements has been checked.
bool invert(const i64* perm, i64 n, i64* inverse) {
  std::fill_n(inverse, n, i64{-1});
  for (i64 k = 0; k < n; ++k) {
    if (inverse[perm[k]] >= 0) return false;
    inverse[perm[k]] = k;
  }
  return true;
}

}  // namespace

Gate may_order(const SmMatrix& m) {
  SM_STOP_IF(m.nnz < 1, SM_OK);
  SM_STOP_IF(m.kind == SM_KIND_NONE, SM_UNTYPED);
  SM_STOP_IF(!is_symmetric_sparse(m), SM_NOT_SYMMETRIC_SPARSE);
  SM_STOP_IF(m.state >= SM_STATE_ORDERED, SM_OK);
  SM_STOP_IF(!is_closed(m), SM_WRONG_STATE);
  return {};
}

SmStatus grow_workspace(SmMatrix& m) {
  const SmStatus status = next_workspace(m);
  if (status != SM_OK) {
    give_back(m.pool, m.work);
    m.work_capacity = 0;
  }
  return status;
}

SmStatus order_as_given(SmMatrix& m, const i64* perm) {
  SM_PASS(may_order(m));
  const i64 n = m.rows;
  if (!perm || !std::all_of(perm, perm + n, [n](i64 row) { return row >= 0 && row < n; })) return SM_BAD_ARGUMENT;
  SM_TRY(need_pool(m));
  Scratch<i64> order;
  Scratch<i64> inverse;
  SM_TRY(inverse.take(m.pool, n));
  if (!invert(perm, n, inverse.data())) return SM_BAD_ARGUMENT;
  SM_TRY(order.take(m.pool, n));
  std::copy_n(perm, n, order.data());
  SM_TRY(grow_workspace(m));
  give_back(m.pool, m.perm);
  give_back(m.pool, m.inv_perm);
  m.perm = order.release();
  m.inv_perm = inverse.release();
  m.state = SM_STATE_ORDERED;
  return SM_OK;
}

}  // namespace sm
