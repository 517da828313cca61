// A <- A + s B.
#include <algorithm>

#include "ginv/entering.hpp"
#include "ginv/operations.hpp"
#include "store/checks.hpp"
#include "store/views.hpp"

namespace sm {

namespace {

SmStatus accumulate_general(SmMatrix& a, SmMatrix& b, double s) {
  if (!is_general_sparse(a) || !is_general_sparse(b)) return SM_KIND_MISMATCH;
  return enter_scaled(a, TreeRows(b), 0, s);
}

// In storage order, never re-mapped: with the packing by columns that is the leading block of a larger A.
SmStatus accumulate_values(SmMatrix& a, const SmMatrix& b, i64 count, double s) {
  if (b.rows > 0 && !b.values) return SM_BAD_ARGUMENT;
  if (count > static_cast<i64>(a.value_count)) return SM_BAD_ARGUMENT;
  drop_separate_factor(a);
  for (i64 i = 0; i < count; ++i) a.values[i] += s * b.values[i];
  void_results(a);
  return SM_OK;
}

// An open matrix added to itself: closing it as the operand would close the target.
SmStatus scale_open(SmMatrix& a, double s) {
  for_each_node(a, [&](i64, NonzeroNode& node) { node.value += scaled(s, node.value); });
  void_results(a);
  return SM_OK;
}

SmStatus accumulate_trees(SmMatrix& a, SmMatrix& b, double s) {
  if (a.state >= SM_STATE_CLOSED) return SM_ALREADY_CLOSED;
  if (!is_symmetric_sparse(b)) return SM_KIND_MISMATCH;
  if (&a == &b) return scale_open(a, s);
  SmStatus status = b.state < SM_STATE_CLOSED ? close(b, missing()) : SM_OK;
  if (!b.row_start) return status;
  // One entry that fails does not stop the others; the last answer is what is reported.
  UpperRows(b).entries(
      [&](i64 i, i64 j, double v) { status = assign(a, std::min(i, j), std::max(i, j), true, scaled(s, v)); });
  return status;
}

SmStatus accumulate_symmetric(SmMatrix& a, SmMatrix& b, double s) {
  if (a.rows < b.rows) return SM_DIMENSION_MISMATCH;
  if (a.format == SM_FORMAT_SPARSE) return accumulate_trees(a, b, s);
  if (!is_dense_format(a.format) || b.kind != SM_KIND_SYMMETRIC || b.format != a.format) return SM_KIND_MISMATCH;
  return accumulate_values(a, b, static_cast<i64>(b.value_count), s);
}

SmStatus accumulate_diagonal(SmMatrix& a, SmMatrix& b, double s) {
  if (a.rows < b.rows) return SM_DIMENSION_MISMATCH;
  if (b.kind != SM_KIND_DIAGONAL) return SM_UNAVAILABLE;
  return accumulate_values(a, b, static_cast<i64>(b.value_count), s);
}

}  // namespace

SmStatus accumulate(SmMatrix& a, SmMatrix& b, double s) {
  if (s == 0.0) return SM_OK;
  switch (a.kind) {
    case SM_KIND_GENERAL:
      return accumulate_general(a, b, s);
    case SM_KIND_DIAGONAL:
      return accumulate_diagonal(a, b, s);
    case SM_KIND_SYMMETRIC:
      return accumulate_symmetric(a, b, s);
    default:
      return SM_UNAVAILABLE;
  }
}

}  // namespace sm
