// Matrices times blocks of vectors.
//
//   A[rows, cols] X        whole matrix   sub-block
//   general 21, 22, 23     yes            yes
//   symmetric 21           yes            in state 1, else 118
//   symmetric 22           yes            124
//   symmetric 23           yes            yes
//   diagonal               yes            yes, but see encloses_diagonal
//
// A' X is formed for whole matrices, of every kind and format.
#include "forms/lines.hpp"
#include "forms/passes.hpp"
#include "forms/tree_products.hpp"
#include "store/checks.hpp"

namespace sm {

namespace {

Gate may_multiply(const SmMatrix& a, const Block& block) {
  SM_STOP_WITH(may_read(a));
  SM_STOP_IF(block.x == block.y, SM_BAD_ARGUMENT);
  return {};
}

// Columns that reach past both ends of the rows: the diagonal crosses such a block, and yet it gives nothing, because
// only the ends of the column range are looked at. Callers know it, so it stays.
bool encloses_diagonal(Range rows, Range cols) { return !rows.has(cols.first) && !rows.has(cols.last); }

Gate may_take_block(const SmMatrix& a, Range rows, Range cols) {
  const bool whole = rows.size() == a.rows && cols.size() == a.cols;
  SM_STOP_IF(a.kind == SM_KIND_DIAGONAL && encloses_diagonal(rows, cols), SM_OK);
  if (a.kind != SM_KIND_SYMMETRIC || whole) return {};
  SM_STOP_IF(a.format == SM_FORMAT_COLUMNS, SM_UNAVAILABLE);
  SM_STOP_IF(a.format == SM_FORMAT_SPARSE && a.state != SM_STATE_CLOSED, SM_REORDERED);
  return {};
}

void clear(const Block& block, i64 length) {
  if (!block.accumulate && block.count > 0) std::fill_n(block.y, length * block.count, 0.0);
}

// Whether most entries lie so near to the diagonal that vectors side by side profit from it, judged by a few rows.
bool stays_near(const UpperRows& a) {
  constexpr i64 looks = 256;
  const i64 step = a.rows / looks + 1;
  i64 entries = 0, far = 0;
  for (i64 i = 0; i < a.rows; i += step) {
    a.row(i, [&](i64 k, double) {
      entries += k != i;
      far += k - i >= kProductReach;
    });
  }
  return 2 * far <= entries;
}

void multiply_whole(const UpperRows& a, const Block& block) {
  const Passes& pass = passes();
  const bool together = block.count > 1 && a.is_ascending && stays_near(a);
  for (i64 v = 0; v < block.count;) {
    const int group = together ? static_cast<int>(std::min<i64>(block.count - v, kProductLanes)) : 1;
    const double* x = block.x + v * a.rows;
    double* y = block.y + v * a.rows;
    if (group > 1) {
      pass.multiply_several(a, x, y, group, block.accumulate);
    } else {
      pass.multiply(a, x, y, block.accumulate);
    }
    v += group;
  }
}

// y += A[outs, ins] x, or y += (A[ins, outs])' x when transposed.
template <class View>
void add_block(const View& a, Range outs, Range ins, const double* x, double* y, bool transposed) {
  const bool sums = View::one_triangle || lines_are_rows(a) != transposed;
  const bool adds = View::one_triangle || !sums;
  const i64 first = std::min(sums ? outs.first : ins.first, adds ? ins.first : outs.first);
  const i64 last = std::max(sums ? outs.last : ins.last, adds ? ins.last : outs.last);
  for (i64 o = first; o <= last; ++o) {
    if (sums && outs.has(o)) y[o - outs.first] += line_sum(a, o, ins, x).total();
    if (adds && ins.has(o)) line_add(a, o, outs, x[o - ins.first], y);
  }
}

template <class View>
void add_each(const View& a, Range outs, Range ins, const Block& block, bool transposed) {
  for (i64 v = 0; v < block.count; ++v) {
    const double* x = block.x + v * ins.size();
    double* y = block.y + v * outs.size();
    if constexpr (View::one_triangle) {
      if (outs.size() == a.rows && ins.size() == a.cols) {
        add_product(a, x, y);
        continue;
      }
    }
    add_block(a, outs, ins, x, y, transposed);
  }
}
void add_each(const TreeRows& a, Range outs, Range ins, const Block& block, bool transposed) {
  if (transposed) {
    add_transposed_tree_product(a, block);
  } else {
    add_tree_product(a, block, outs, ins);
  }
}

}  // namespace

SmStatus multiply(SmMatrix& a, const Block& block, Range rows, Range cols) {
  SM_PASS(may_multiply(a, block));
  if (!rows.is_within(a.rows) || !cols.is_within(a.cols)) return SM_BAD_ARGUMENT;
  if (is_symmetric_sparse(a) && rows.size() == a.rows && cols.size() == a.cols) {
    multiply_whole(UpperRows(a), block);
    return SM_OK;
  }
  clear(block, rows.size());
  if (block.count < 1) return SM_OK;
  SM_PASS(may_take_block(a, rows, cols));
  const auto add = [&](const auto& view) {
    add_each(view, rows, cols, block, false);
    return SM_OK;
  };
  return visit(a, add, SM_OK);
}

SmStatus multiply_transposed(SmMatrix& a, const Block& block) {
  SM_PASS(may_multiply(a, block));
  if (is_symmetric_sparse(a)) {
    multiply_whole(UpperRows(a), block);
    return SM_OK;
  }
  clear(block, a.cols);
  if (block.count < 1) return SM_OK;
  const auto add = [&](const auto& view) {
    add_each(view, {0, a.cols - 1}, {0, a.rows - 1}, block, true);
    return SM_OK;
  };
  return visit(a, add, SM_OK);
}

}  // namespace sm
