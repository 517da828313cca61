// Whole matrices entered at once, with the structure that random elements rarely have: definite, semidefinite with
// repeated and zero rows, indefinite, of small and of moderate order.
#include <cmath>

#include "model/machine.hpp"

namespace sm::test {

namespace {

void enter(Machine& m, Model& x, Index row, Index col, double value) {
  if (m.loose()) return;
  m.begin("qxsmassign", x, row, col, false, value);
  m.answer(m.fn().qxsmassign(x.handle, row, col, 0, value), model_assign(x, row, col, false, value));
}

// Strictly dominant on a random pattern; with `sign` -1 in one row, indefinite.
Values dominant(Machine& m, Index n, bool indefinite) {
  Values a(n, n);
  const Index percent = 10 + m.random.below(80);
  for (Index i = 0; i < n; ++i)
    for (Index j = i + 1; j < n; ++j)
      if (m.random.chance(percent)) a(i, j) = m.random.dyadic() / 4;
  for (Index i = 0; i < n; ++i) {
    double rest = 1 + static_cast<double>(m.random.below(8)) / 4;
    for (Index j = 0; j < n; ++j) rest += std::fabs(i < j ? a(i, j) : j < i ? a(j, i) : 0.0);
    a(i, i) = rest;
  }
  if (indefinite && n > 0) {
    const Index bad = m.random.below(n);
    a(bad, bad) = -a(bad, bad);
  }
  return a;
}

// T' B T for a dominant B and a T of unit and zero columns: rows repeat, or are zero.
Values semidefinite(Machine& m, Index n) {
  const Index rank = 1 + m.random.below(std::max<Index>(n, 1));
  const Values b = dominant(m, rank, false);
  std::vector<Index> which;
  for (Index i = 0; i < n; ++i) which.push_back(m.random.chance(15) ? -1 : m.random.below(rank));
  Values a(n, n);
  for (Index i = 0; i < n; ++i)
    for (Index j = i; j < n; ++j) {
      const Index p = std::min(which[static_cast<std::size_t>(i)], which[static_cast<std::size_t>(j)]);
      const Index q = std::max(which[static_cast<std::size_t>(i)], which[static_cast<std::size_t>(j)]);
      if (p >= 0) a(i, j) = b(p, q);
    }
  return a;
}

double diagonal_value(Machine& m) {
  constexpr double kValues[] = {4, 9, 0, 0.25, -0.00005, 1, 2.25, -3};
  return kValues[m.random.below(m.random.chance(20) ? 8 : 7)];
}

void fill_symmetric(Machine& m, Model& x) {
  const Index family = m.random.below(5);
  const Values a = family < 2   ? dominant(m, x.rows, false)
                   : family < 4 ? semidefinite(m, x.rows)
                                : dominant(m, x.rows, true);
  for (Index i = 0; i < x.rows; ++i)
    for (Index j = i; j < x.rows; ++j)
      if (x.dense() || i == j || a(i, j) != 0) enter(m, x, i, j, a(i, j));
}

void call_fill(Machine& m) {
  Model* x = m.any([](const Model& y) { return !y.none(); });
  if (!x) return;
  if (x->rows < 1 || m.random.chance(60) || (x->symmetric_sparse() && x->state > SM_STATE_OPEN)) {
    const Index rows = m.order();
    const Index cols = x->general() && m.random.chance(40) ? m.order() : rows;
    m.begin("qxsmresize", *x, rows, cols);
    const SmStatus want = model_resize(*x, rows, cols);
    m.answer(m.fn().qxsmresize(x->handle, rows, cols), want);
    if (m.loose() || want != SM_OK) return;
  }
  const Index percent = x->dense() ? 100 : 20 + m.random.below(60);
  if (x->symmetric()) fill_symmetric(m, *x);
  for (Index i = 0; i < x->rows && !x->symmetric(); ++i)
    for (Index j = x->diagonal() ? i : 0; j < (x->diagonal() ? i + 1 : x->cols); ++j)
      if (m.random.chance(percent)) enter(m, *x, i, j, x->diagonal() ? diagonal_value(m) : m.dyadic());
  if (m.loose() || !m.random.chance(80)) return;
  m.begin("qxsmclose", *x, kNan);
  m.answer(m.fn().qxsmclose(x->handle, kNan), model_close(*x, kNan));
}

}  // namespace

void add_filling_calls(std::vector<Call>& list) { list.push_back({call_fill, 16}); }

}  // namespace sm::test
