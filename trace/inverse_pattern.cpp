// The trace of a product with an inverse that needs no more of the inverse than its elements on the pattern of the
// factor.
#include "cholesky/selected_inverse.hpp"
#include "store/views.hpp"
#include "trace/operations.hpp"

namespace sm {

namespace {

// Row j of B is its column j then, and all rows can be read.
bool is_read_as_a_whole(const SmMatrix& b) {
  return b.nnz > 0 && (b.kind == SM_KIND_DIAGONAL || (b.kind == SM_KIND_SYMMETRIC && b.state <= SM_STATE_ORDERED));
}

bool is_on_pattern(const SmMatrix& a, SmMatrix& b) {
  bool stray = true;
  const SmStatus status = visit(b, [&](const auto& view) {
    stray = view.any([&](i64 i, i64 j, double) { return !SelectedInverse::is_on_pattern(a, i, j); });
    return SM_OK;
  });
  return status == SM_OK && !stray;
}

}  // namespace

bool trace_on_pattern(SmMatrix& a, SmMatrix& b, double& result) {
  if (!is_symmetric_sparse(a) || !is_read_as_a_whole(b) || !is_on_pattern(a, b)) return false;
  SelectedInverse inverse(a);
  if (inverse.compute() != SM_OK) return false;
  double sum = 0.0;
  (void)visit(b, [&](const auto& view) {
    view.entries([&](i64 i, i64 j, double v) { sum += (i == j ? 1.0 : 2.0) * v * *inverse.find(i, j); });
    return SM_OK;
  });
  result = sum;
  return true;
}

}  // namespace sm
