// Adding s B into the trailing block of G that starts at (off, off).
#include <cmath>

#include "ginv/entering.hpp"
#include "ginv/operations.hpp"
#include "store/checks.hpp"
#include "store/views.hpp"

namespace sm {

namespace {

// Calls f(i, j, value) for the stored elements of G's block, i <= j for a symmetric G, open or not.
template <class F>
void for_each_in_block(SmMatrix& g, i64 off, F&& f) {
  const auto inside = [&](i64 i, i64 j, double& v) {
    if (i >= off && j >= off) f(i, j, v);
  };
  if (is_symmetric_sparse(g)) {
    for_each_node(g, [&](i64 i, NonzeroNode& node) { inside(i, node.key, node.value); });
  } else {
    (void)visit(g, [&](auto view) {
      view.entries(inside);
      return SM_OK;
    });
  }
}

// A change like any other, and the only one when B has nothing to add.
void drop_small(SmMatrix& g, i64 off, double tolerance) {
  if (!(tolerance > 0.0)) return;
  bool changed = false;
  for_each_in_block(g, off, [&](i64, i64, double& v) {
    if (!(std::fabs(v) <= tolerance)) return;
    changed = changed || v != 0.0;
    v = 0.0;
  });
  if (!changed) return;
  drop_separate_factor(g);
  void_results(g);
}

// The block as it was, into P at the block's own numbering.
SmStatus save_block(SmMatrix& g, SmMatrix& p, i64 off) {
  SmStatus status = SM_OK;
  for_each_in_block(g, off, [&](i64 i, i64 j, double v) {
    if (status == SM_OK) status = assign(p, i - off, j - off, false, v);
  });
  return status;
}

SmStatus add_general(SmMatrix& g, SmMatrix& b, i64 off, double s) {
  if (!is_general_sparse(g) || !is_general_sparse(b)) return SM_UNAVAILABLE;
  if (off < 0) return SM_BAD_ARGUMENT;
  return enter_scaled(g, TreeRows(b), off, s);
}

SmStatus add_diagonal(SmMatrix& g, SmMatrix& b, SmMatrix* p, i64 off, double s) {
  if (b.kind != SM_KIND_DIAGONAL) return SM_UNAVAILABLE;
  const i64 count = static_cast<i64>(b.value_count);
  if (off < 0 || off > g.rows || count > g.rows - off) return SM_BAD_ARGUMENT;
  for (i64 i = 0; p && i < count; ++i) SM_TRY(assign(*p, i, i, false, g.values[off + i]));
  drop_separate_factor(g);
  for (i64 i = 0; i < count; ++i) g.values[off + i] += s * b.values[i];
  void_results(g);
  return SM_OK;
}

SmStatus add_symmetric(SmMatrix& g, SmMatrix& b, i64 off, double s) {
  if (b.nnz < 1) return SM_OK;
  return visit(b, [&](const auto& view) { return enter_scaled(g, view, off, s); });
}

Gate may_add_symmetric(const SmMatrix& g, const SmMatrix& b, i64 off) {
  SM_STOP_IF(off < 0, SM_BAD_ARGUMENT);
  SM_STOP_IF(b.rows != g.rows - off, SM_DIMENSION_MISMATCH);
  SM_STOP_IF(b.kind != SM_KIND_SYMMETRIC && b.kind != SM_KIND_DIAGONAL, SM_UNAVAILABLE);
  SM_STOP_IF(is_symmetric_sparse(g) && g.state > SM_STATE_OPEN, SM_ALREADY_CLOSED);
  SM_STOP_IF(!is_closed_or_empty(b), SM_NOT_CLOSED);
  return {};
}

}  // namespace

SmStatus add_ginv(SmMatrix& g, SmMatrix& b, SmMatrix* p, i64 off, double s, double tolerance) {
  if (g.nnz < 1) return SM_OK;
  if (&g == &b || p == &g || p == &b) return SM_BAD_ARGUMENT;
  if (std::isnan(tolerance)) tolerance = g.instance->tolerances[3];
  if (g.kind == SM_KIND_GENERAL) {
    SM_TRY(add_general(g, b, off, s));
  } else if (g.kind == SM_KIND_DIAGONAL) {
    SM_TRY(add_diagonal(g, b, p, off, s));
  } else if (g.kind == SM_KIND_SYMMETRIC) {
    SM_PASS(may_add_symmetric(g, b, off));
    if (p) {
      SM_TRY(resize(*p, b.rows, b.rows));
      SM_TRY(save_block(g, *p, off));
    }
    SM_TRY(add_symmetric(g, b, off, s));
  } else {
    return SM_UNAVAILABLE;
  }
  drop_small(g, off, tolerance);
  return SM_OK;
}

}  // namespace sm
