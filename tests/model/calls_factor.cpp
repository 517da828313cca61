// Ordering, factorization, rank, log-determinant, pivots.
#include <cmath>

#include "model/machine.hpp"

namespace sm::test {

bool factor_is_clear(const Model& m) {
  if (m.empty() || !m.closed() || m.state >= SM_STATE_FACTORED || !m.symmetric()) return true;
  if (m.packed()) return eliminate(m.v, natural_order(m.rows), kTolerance).clear;
  if (!m.perm.empty()) return eliminate(m.v, m.perm, kTolerance).clear;
  return m.rows > kSmallOrder ? clear_in_some_orders(m.v) : clear_in_every_order(m.v);
}

namespace {

// The ordering is the module's choice; that it is a permutation is all that the model asks.
void take_order(Model& m) {
  if (!m.perm.empty()) return;
  m.perm = natural_order(m.rows);
  std::vector<bool> seen(m.perm.size(), false);
  for (Index k = 0; m.handle->perm && k < m.rows; ++k) {
    const Index row = m.handle->perm[k];
    if (row < 0 || row >= m.rows || seen[static_cast<std::size_t>(row)] || m.handle->inv_perm[row] != k) return;
    seen[static_cast<std::size_t>(row)] = true;
  }
  for (Index k = 0; m.handle->perm && k < m.rows; ++k) m.perm[static_cast<std::size_t>(k)] = m.handle->perm[k];
}

SmStatus factor_values(Model& m) {
  const Elimination e = eliminate(m.v, m.perm, kTolerance);
  m.unsure = !e.clear;  // the module's order of a matrix that is too large to have been tried in every one
  m.definite = e.definite;
  if (!e.definite) return SM_NOT_DEFINITE;
  m.state = SM_STATE_FACTORED;
  m.rank = e.rank;
  m.log_det = static_cast<double>(e.log_det);
  m.factor = SparseFactor{Values(m.rows, m.rows), {}};
  for (Index k = 0; k < m.rows; ++k) {
    const std::size_t at = static_cast<std::size_t>(k);
    m.factor.reciprocal.push_back(e.accepted[at] ? static_cast<double>(1 / e.d[at]) : 0.0);
    // Rows of dropped pivots are multiplied by 0 in every use: what the factor keeps there is its own business.
    for (Index j = k; j < m.rows; ++j) m.factor.u(k, j) = static_cast<double>(e.u(k, j));
  }
  m.reads_factor = true;
  m.factor_slack = 16 * static_cast<double>(e.error) + 8 * kEps;
  return SM_OK;
}

SmStatus factor_diagonal(Model& m, Values& d) {
  m.definite = 1;
  m.rank = 0;
  m.log_det = 0;
  for (Index i = 0; i < m.rows; ++i) {
    if (d(i, i) > kTolerance) {
      m.log_det += std::log(d(i, i));
      d(i, i) = std::sqrt(d(i, i));
      m.rank += 1;
    } else if (d(i, i) < -0.0001) {
      m.definite = 0;
      m.takes_cached = true;
      return SM_NOT_DEFINITE;
    } else {
      d(i, i) = 0;
    }
  }
  return SM_OK;
}

SmStatus factor_packed(Model& m, Values& r) {
  const Elimination e = eliminate(m.v, natural_order(m.rows), kTolerance);
  m.definite = e.definite;
  if (!e.definite) {
    m.takes_cached = true;
    return SM_NOT_DEFINITE;
  }
  m.rank = e.rank;
  m.log_det = static_cast<double>(e.log_det);
  r = packed_factor(e);
  m.slack = m.separate_slack = 16 * static_cast<double>(e.error);
  return SM_OK;
}

}  // namespace

SmStatus model_factor(Model& m, bool in_place) {
  if (m.empty() || m.state == SM_STATE_FACTORED) return SM_OK;
  if (m.none()) return SM_UNTYPED;
  if (m.state == SM_STATE_INVERTED) return SM_INVERTED;
  if (!m.closed()) return SM_NOT_CLOSED;
  if (m.general()) return SM_UNAVAILABLE;
  if (m.sparse()) {
    take_order(m);
    m.state = SM_STATE_SYMBOLIC;
    return factor_values(m);
  }
  m.separate = !in_place;
  Values& target = in_place ? m.v : m.w;
  if (!in_place) m.w = m.v;
  const SmStatus status = m.diagonal() ? factor_diagonal(m, target) : factor_packed(m, target);
  if (status == SM_OK) m.state = SM_STATE_FACTORED;
  m.leftover = m.leftover || status != SM_OK;
  if (m.separate) m.slack = 0;
  return status;
}

namespace {

void call_order(Machine& m) {
  Model* x = m.random.chance(90) ? m.any([](const Model& y) { return y.symmetric_sparse(); }) : m.any();
  if (!x) return;
  m.begin("qxsmmd", *x);
  const SmStatus got = qxsmmd(x->handle);
  if (x->empty()) return m.answer(got, SM_OK);
  if (!x->symmetric_sparse()) return m.answer(got, SM_NOT_SYMMETRIC_SPARSE);
  if (x->state >= SM_STATE_ORDERED) return m.answer(got, SM_OK);
  if (!x->closed()) return m.answer(got, SM_WRONG_STATE);
  m.answer(got, SM_OK);
  take_order(*x);
  x->state = SM_STATE_ORDERED;
}

void call_reorder(Machine& m) {
  Model* x = m.random.chance(90) ? m.any([](const Model& y) { return y.symmetric_sparse(); }) : m.any();
  if (!x) return;
  m.begin("qxsmreorder", *x);
  const SmStatus got = qxsmreorder(x->handle);
  if (x->empty() || x->state >= SM_STATE_REORDERED) return m.answer(got, SM_OK);
  if (x->state != SM_STATE_ORDERED) return m.answer(got, SM_WRONG_STATE);
  m.answer(got, SM_OK);
  x->state = SM_STATE_REORDERED;
}

void call_symbolic(Machine& m) {
  Model* x = m.random.chance(90) ? m.any([](const Model& y) { return y.symmetric_sparse(); }) : m.any();
  if (!x) return;
  m.begin("qxsmsymbfact", *x);
  const SmStatus got = qxsmsymbfact(x->handle);
  if (x->empty() || x->state == SM_STATE_SYMBOLIC) return m.answer(got, SM_OK);
  if (!x->closed()) return m.answer(got, SM_NOT_CLOSED);
  if (x->state >= SM_STATE_FACTORED) return m.answer(got, SM_OK);
  if (x->state != SM_STATE_REORDERED) return m.answer(got, SM_WRONG_STATE);
  m.answer(got, SM_OK);
  x->state = SM_STATE_SYMBOLIC;
}

void call_numeric(Machine& m) {
  Model* x = m.random.chance(90) ? m.any([](const Model& y) { return y.symmetric_sparse(); }) : m.any();
  if (!x || !factor_is_clear(*x)) return;
  m.begin("qxsmnumfact", *x);
  const SmStatus got = qxsmnumfact(x->handle);
  if (x->empty() || x->state == SM_STATE_FACTORED) return m.answer(got, SM_OK);
  if (!x->closed()) return m.answer(got, SM_NOT_CLOSED);
  if (x->state > SM_STATE_FACTORED) return m.answer(got, SM_OK);
  if (x->state != SM_STATE_SYMBOLIC || !x->symmetric_sparse()) return m.answer(got, SM_WRONG_STATE);
  m.answer(got, factor_values(*x));
}

void call_fact(Machine& m) {
  Model* x = solvable(m);
  if (!x) return;
  const std::int32_t flags[] = {0, 0, 1, 0x10000, 0x10002};
  const std::int32_t in_place = flags[m.random.below(5)];
  m.begin("qxsmfact", *x, in_place);
  const SmStatus got = m.fn().qxsmfact(x->handle, in_place);
  m.answer(got, model_factor(*x, (in_place & 0xFFFF) != 0));
}

void call_logdet(Machine& m) {
  Model* x = solvable(m);
  if (!x) return;
  double out = 0;
  m.begin("qxsmlogdet", *x);
  const SmStatus got = m.fn().qxsmlogdet(x->handle, &out);
  SmStatus want = SM_OK;
  if (x->empty())
    want = SM_NOTHING_TO_REPORT;
  else if (!x->closed())
    want = SM_NOT_CLOSED;
  else if (x->rows != x->cols)
    want = SM_NOT_SQUARE;
  else if (x->general())
    want = SM_UNAVAILABLE;
  else if (x->state < SM_STATE_FACTORED)
    want = model_factor(*x, false);
  m.answer(got, want);
  const double expected = want == SM_OK ? x->log_det : missing_value();
  m.same(out, expected, 1e-9 * (1 + std::fabs(expected)), "log-determinant");
  if (std::isnan(expected) && !is_missing(out)) m.wrong("not the missing value");
}

void call_rank(Machine& m) {
  Model* x = solvable(m);
  if (!x) return;
  Index out = 77;
  m.begin("qxsmrank", *x);
  const SmStatus got = m.fn().qxsmrank(x->handle, &out);
  SmStatus want = SM_OK;
  if (x->empty())
    want = SM_NOTHING_TO_REPORT;
  else if (!x->closed())
    want = SM_NOT_CLOSED;
  else if (x->general())
    want = SM_UNAVAILABLE;
  else if (x->state < SM_STATE_FACTORED)
    want = model_factor(*x, false);
  m.answer(got, want);
  if (out != (want == SM_OK ? x->rank : 0)) m.wrong("rank " + std::to_string(out));
}

SmStatus want_pivots(Model& x, std::string& out) {
  if (const auto status = not_readable(x)) return *status;
  if (x.rows != x.cols) return SM_NOT_SQUARE;
  const std::size_t n = static_cast<std::size_t>(x.rows);
  if (!x.general() && x.state < SM_STATE_FACTORED) {
    const SmStatus status = model_factor(x, false);
    if (status != SM_OK) return status;
  }
  out.replace(0, n, n, '0');
  if (x.general()) return SM_UNAVAILABLE;
  for (Index i = 0; i < x.rows; ++i) {
    const Values& judged = x.diagonal() ? x.v : x.second();
    const std::size_t row = static_cast<std::size_t>(x.sparse() ? x.perm[static_cast<std::size_t>(i)] : i);
    const double pivot = x.sparse() ? x.factor.reciprocal[static_cast<std::size_t>(i)] : judged(i, i);
    if (pivot > 0) out[row] = '1';
  }
  return SM_OK;
}

void call_pivot(Machine& m) {
  Model* x = solvable(m);
  if (!x) return;
  std::string out(static_cast<std::size_t>(x->rows) + 2, '?');
  std::string expected = out;
  m.begin("qxsmpivot", *x);
  const SmStatus got = m.fn().qxsmpivot(x->handle, out.data());
  m.answer(got, want_pivots(*x, expected));
  if (out != expected) m.wrong("pivots " + out + ", not " + expected);
}

}  // namespace

void add_factor_calls(std::vector<Call>& list) {
  list.insert(list.end(), {{call_order, 4},
                           {call_reorder, 4},
                           {call_symbolic, 4},
                           {call_numeric, 4},
                           {call_fact, 14},
                           {call_logdet, 6},
                           {call_rank, 6},
                           {call_pivot, 4}});
}

}  // namespace sm::test
