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

// Where the inverse has the entries of B, in their storage order; false when it lacks one.
bool find_places(const SmMatrix& a, SmMatrix& b, i64* place) {
  bool stray = true;
  const i64* const end = place + b.nnz;
  const SmStatus status = visit(b, [&](const auto& view) {
    stray = view.any([&](i64 i, i64 j, double) {
      if (place == end) return true;
      *place = SelectedInverse::place(a, i, j);
      return *place++ == SelectedInverse::kNowhere;
    });
    return SM_OK;
  });
  return status == SM_OK && !stray;
}

}  // namespace

bool trace_on_pattern(SmMatrix& a, SmMatrix& b, double& result) {
  if (!is_symmetric_sparse(a) || !is_read_as_a_whole(b)) return false;
  if (b.nnz > a.rows + a.factor_iu[a.rows]) return false;
  Scratch<i64> places;
  if (places.take(a.pool, b.nnz) != SM_OK || !find_places(a, b, places.data())) return false;
  SelectedInverse inverse(a);
  if (inverse.compute() != SM_OK) return false;
  double sum = 0.0;
  const i64* place = places.data();
  (void)visit(b, [&](const auto& view) {
    view.entries([&](i64 i, i64 j, double v) { sum += (i == j ? 1.0 : 2.0) * v * inverse.at(*place++); });
    return SM_OK;
  });
  result = sum;
  return true;
}

}  // namespace sm
