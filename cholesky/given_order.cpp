// An ordering that the caller brings, and what any ordering asks first.
#include <algorithm>

#include "cholesky/ordering_steps.hpp"
#include "cholesky/steps.hpp"
#include "store/checks.hpp"

namespace sm {

namespace {

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
  SM_TRY(take_workspace(m, std::max<i64>(m.nnz - n, 0)));  // each row has its diagonal
  give_back(m.pool, m.perm);
  give_back(m.pool, m.inv_perm);
  m.perm = order.release();
  m.inv_perm = inverse.release();
  m.state = SM_STATE_ORDERED;
  return SM_OK;
}

}  // namespace sm
