// A Gram-Schmidt sweep over flagged rows of a general sparse matrix.
#include <cmath>

#include "forms/kernels.hpp"
#include "ginv/operations.hpp"
#include "store/checks.hpp"
#include "store/nodes.hpp"
#include "store/operations.hpp"

namespace sm {

namespace {

void empty_row(SmMatrix& a, i64 k) {
  for (NonzeroNode* node = first_node(a, k); node;) {
    NonzeroNode* next = sm_node_next(node);
    unlink_node(a, k, node->key);
    node = next;
  }
}

// Row k becomes v. Only components below epsilon are written: that direction of the test is the operation's, whatever
// it does to larger ones.
SmStatus rewrite_row(SmMatrix& a, i64 k, const double* v, double epsilon) {
  empty_row(a, k);
  for (i64 j = 0; j < a.cols; ++j) {
    if (std::fabs(v[j]) < epsilon) SM_TRY(enter_node(a, k, j, false, v[j]));
  }
  return SM_OK;
}

SmStatus sweep_row(SmMatrix& a, i64 i, std::int16_t* active, double tolerance, double* u, double* v) {
  active[i] = 0;
  SM_TRY(row(a, i, u, 0));
  const double s = hzvdot11(u, u, a.cols);
  if (!(s > tolerance)) return SM_OK;
  // Row i stays and is not empty, or there would be no component of it: the matrix always has rows to give.
  for (i64 k = 0; k < a.rows; ++k) {
    if (!active[k]) continue;
    SM_TRY(row(a, k, v, 0));
    const double c = hzvdot11(u, v, a.cols) / s;
    if (!(std::fabs(c) > tolerance)) continue;
    add_multiple(v, u, a.cols, -c);
    SM_TRY(rewrite_row(a, k, v, a.instance->tolerances[0]));
  }
  return SM_OK;
}

Gate may_orthogonalise(const SmMatrix& a) {
  SM_STOP_WITH(may_read(a));
  SM_STOP_IF(a.rows != a.cols, SM_NOT_SQUARE);
  SM_STOP_IF(!is_general_sparse(a), SM_UNAVAILABLE);
  return {};
}

}  // namespace

SmStatus orthogonalise(SmMatrix& a, std::int16_t* active, i64 lo, i64 hi, double tolerance) {
  SM_PASS(may_orthogonalise(a));
  Scratch<double> u;
  Scratch<double> v;
  SM_TRY(u.take(a.pool, a.rows));
  SM_TRY(v.take(a.pool, a.rows));
  for (i64 i = 0; i < a.rows; ++i) {
    if (active[i] && (i < lo || i >= hi)) SM_TRY(sweep_row(a, i, active, tolerance, u.data(), v.data()));
  }
  return SM_OK;
}

}  // namespace sm
