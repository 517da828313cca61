// Products over the lines of a view: what storage keeps together, a column of an array by columns, else a row.
//
// A line o takes part in a product in two ways. It gives the sum of its entries times the components of x that they
// stand beside, to component o of the result (line_sum); or it takes component o of x and adds its multiples to the
// result (line_add). Stored rows do the first in A x and the second in A' x, stored columns the other way round, and
// the lines of a triangle do both, each entry off the diagonal standing for two elements.
#pragma once

#include <algorithm>
#include <type_traits>

#include "forms/lanes.hpp"
#include "forms/operations.hpp"
#include "store/views.hpp"

namespace sm {

// Entries of a line that lie side by side: v[0] is at index `first`.
struct Stretch {
  const double* v;
  i64 first;
  i64 count;
};

inline Stretch run_of(const FullArray& a, i64 o) {
  return a.layout.col_step == 1 ? Stretch{a.find(o, 0), 0, a.cols} : Stretch{a.find(0, o), 0, a.rows};
}
inline Stretch run_of(const DiagonalArray& a, i64 o) { return {a.values + o, o, 1}; }
// Without the diagonal, which is at one end.
inline Stretch run_of(const Packed<PackedColumns>& a, i64 o) { return {a.diagonal(o) - o, 0, o}; }
inline Stretch run_of(const Packed<PackedRows>& a, i64 o) { return {a.diagonal(o) + 1, o + 1, a.cols - 1 - o}; }

template <class View>
concept InRuns = requires(const View& a) {
  run_of(a, i64{0});
};

inline Stretch clip(const Stretch& run, Range range) {
  const i64 first = std::max(run.first, range.first);
  const i64 last = std::min(run.first + run.count - 1, range.last);
  return first > last ? Stretch{nullptr, first, 0} : Stretch{run.v + (first - run.first), first, last - first + 1};
}

// The first node at or after `key` in the subtree below `top`, or null.
inline NonzeroNode* first_below(NonzeroNode* top, i64 key) {
  NonzeroNode* best = nullptr;
  for (;;) {
    const bool before = top->key < key;
    if (!before) best = top;
    const uint64_t down = before ? top->right : top->left;
    if (down & SM_LINK_THREAD) return best;
    top = node_of(down);
  }
}

// The first node at or after `key` among `node` and its successors, or null. `node` is the first of its tree: from it
// the threads lead up the left spine, past one right subtree after the other, until one of them has to be entered. What
// a root word holds is the tree's own business, so there is no starting at the top.
inline NonzeroNode* first_from(NonzeroNode* node, i64 key) {
  while (node && node->key < key) {
    if (node->right & SM_LINK_THREAD) {
      node = node_of(node->right);
      continue;
    }
    NonzeroNode* below = node_of(node->right);
    NonzeroNode* last = below;
    while (!(last->right & SM_LINK_THREAD)) last = node_of(last->right);
    if (last->key >= key) return first_below(below, key);
    node = node_of(last->right);
  }
  return node;
}

// f(k, value) for the entries of line o with indices in the range, for the views whose lines are not runs.
template <class F>
void for_line(const TreeRows& a, i64 o, Range range, F&& f) {
  NonzeroNode* node = first_from(first_node(a.m, o), range.first);
  for (; node && node->key <= range.last; node = sm_node_next(node)) f(node->key, node->value);
}
template <class F>
void for_line(const UpperRows& a, i64 o, Range range, F&& f) {
  a.row_between(o, range.first, range.last, f);
}

// Entries of a line times components of x. A triangle keeps its diagonal entry apart, because the others count twice.
// What is not there takes no part: where nothing is stored, not even a NaN comes out.
struct LineSum {
  double off = 0.0;
  double diagonal = 0.0;
  bool has_off = false;
  bool has_diagonal = false;

  void add_off(double term) {
    off += term;
    has_off = true;
  }
  void add_diagonal(double term) {
    diagonal += term;
    has_diagonal = true;
  }
  double total() const { return diagonal + off; }
  bool has_any() const { return has_diagonal || has_off; }
};

// x[0] belongs to index range.first.
template <class View>
LineSum line_sum(const View& a, i64 o, Range range, const double* x) {
  LineSum sum;
  if constexpr (InRuns<View>) {
    const Stretch run = clip(run_of(a, o), range);
    if (run.count > 0) sum.add_off(lane_dot(run.v, x + (run.first - range.first), run.count));
    if (View::one_triangle && range.has(o)) sum.add_diagonal(*a.diagonal(o) * x[o - range.first]);
  } else {
    for_line(a, o, range, [&](i64 k, double v) {
      const double term = v * x[k - range.first];
      View::one_triangle&& k == o ? sum.add_diagonal(term) : sum.add_off(term);
    });
  }
  return sum;
}

// y += t times the entries of line o, but for the diagonal of a triangle; y[0] belongs to index range.first.
template <class View>
void line_add(const View& a, i64 o, Range range, double t, double* y) {
  if constexpr (InRuns<View>) {
    const Stretch run = clip(run_of(a, o), range);
    if (run.count > 0) lane_add(y + (run.first - range.first), run.v, run.count, t);
  } else {
    for_line(a, o, range, [&](i64 k, double v) {
      if (!View::one_triangle || k != o) y[k - range.first] += t * v;
    });
  }
}

// Whether the lines of a view are rows of the matrix; asked of views that store both triangles.
template <class View>
bool lines_are_rows(const View&) {
  return true;
}
inline bool lines_are_rows(const FullArray& a) { return a.layout.col_step == 1; }

// Both ways at once for a whole line of a triangle.
template <class View>
void line_exchange(const View& a, i64 o, const double* x, double* y) {
  const Stretch run = run_of(a, o);
  line_add(a, o, {0, a.cols - 1}, x[o], y);
  y[o] += *a.diagonal(o) * x[o] + lane_dot(run.v, x + run.first, run.count);
}
inline void line_exchange(const UpperRows& a, i64 o, const double* x, double* y) {
  const double t = x[o];
  double sum = 0.0;
  a.row(o, [&](i64 k, double v) {
    sum += v * x[k];
    if (k != o) y[k] += v * t;
  });
  y[o] += sum;
}

// y += A x for a whole matrix. Compressed rows have passes of their own (forms/passes.hpp); this is their plain road.
template <class View>
requires View::one_triangle void add_product(const View& a, const double* x, double* y) {
  for (i64 o = 0; o < a.rows; ++o) line_exchange(a, o, x, y);
}

}  // namespace sm
