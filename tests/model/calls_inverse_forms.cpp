// Forms and traces around an inverse.
#include <cmath>

#include "model/machine.hpp"

namespace sm::test {

namespace {

// x' w, w known within its slack.
Sum dot(const double* x, const Wanted& w, Index from, Index n) {
  Sum sum;
  for (Index i = 0; i < n; ++i) {
    sum.add(x[i], w.value(from + i));
    sum.widen(std::fabs(x[i]) * w.slack(from + i));
  }
  return sum;
}

void call_invquadv(Machine& m) {
  Model* a = solvable(m);
  if (!a) return;
  const Index p = m.random.below(4);
  const std::int32_t format = m.random.chance(50) ? 23 : 22;
  const bool same = m.random.chance(3);
  std::vector<double> x = m.dyadics(kBlock);
  const std::vector<double> kept = x;
  std::vector<double> r = m.blank(16);
  m.begin("qxsminvquadv", *a, p, format, same);
  const SmStatus got = m.fn().qxsminvquadv(a->handle, x.data(), same ? x.data() : r.data(), p, format);
  Wanted want(16);
  Wanted w(kBlock);
  SmStatus status = SM_OK;
  if (!a->empty()) {
    if (same)
      status = SM_BAD_ARGUMENT;
    else if (!a->closed())
      status = SM_NOT_CLOSED;
    else if (a->in_place())
      status = SM_NO_FACTOR;
    else if (a->general())
      status = SM_UNAVAILABLE;
    else
      status = model_inverse_product(m, *a, kept.data(), false, p, w);
    for (Index j = 0; j < p && status == SM_OK; ++j)
      for (Index i = 0; i <= j; ++i)
        want.set(slot_of(SM_KIND_SYMMETRIC, format, p, p, i, j), dot(x.data() + i * a->rows, w, j * a->rows, a->rows));
  }
  m.answer(got, status);
  m.output(r.data(), want);
}

// The diagonal operand's own road: dividing by f * f, a dropped f included.
Sum divided(const Model& a, const double* x, const double* y) {
  Sum sum;
  for (Index i = 0; i < a.rows; ++i) {
    const double f = a.w(i, i);
    if (a.state == SM_STATE_INVERTED) {
      sum.add(x[i], y[i], f);
      continue;
    }
    sum.add(x[i], y[i], 1 / (f * f));
    if (f > 0) sum.widen(4 * kEps * std::fabs(x[i] * y[i] / (f * f)));
  }
  return sum;
}

void call_invbilin(Machine& m) {
  Model* a = solvable(m);
  if (!a) return;
  const Index p = m.random.below(4);
  const Index q = m.random.below(4);
  const bool same = m.random.chance(3);
  const Index n = a->rows;
  const std::vector<double> x = m.dyadics(kBlock);
  std::vector<double> y = m.dyadics(kBlock);
  std::vector<double> r = m.blank(16);
  m.begin("qxsminvbilin", *a, p, q, same);
  const SmStatus got = qxsminvbilin(a->handle, x.data(), y.data(), same ? y.data() : r.data(), p, q);
  Wanted want(16);
  Wanted w(kBlock);
  SmStatus status = SM_OK;
  if (const auto refused = not_readable(*a)) {
    status = *refused;
  } else if (a->in_place()) {
    status = SM_NO_FACTOR;
  } else if (same) {
    status = SM_BAD_ARGUMENT;
  } else if (a->rows != a->cols) {
    status = SM_NOT_SQUARE;
  } else {
    want.clear(p * q);
    if (a->symmetric())
      status = model_inverse_product(m, *a, y.data(), false, q, w);
    else if (a->general())
      status = SM_UNAVAILABLE;
    else if (a->state < SM_STATE_FACTORED)
      status = model_factor(*a, false);
    settle(m, *a);
    for (Index j = 0; j < q && status == SM_OK; ++j)
      for (Index i = 0; i < p; ++i)
        want.set(i + j * p,
                 a->diagonal() ? divided(*a, x.data() + i * n, y.data() + j * n) : dot(x.data() + i * n, w, j * n, n));
  }
  m.answer(got, status);
  m.output(r.data(), want);
}

// The sum of what the solves with the rows of B leave at their own places.
SmStatus sum_of_solves(const Model& a, const Model& b, Index start, Sum& sum) {
  if (start < 0) return SM_OUTSIDE;
  for (Index j = start; j < a.rows; ++j) {
    const Index width = std::max(a.rows, b.cols);
    Wanted row(width);
    row.clear(width);
    const SmStatus status = want_row(b, j, start, row);
    if (status != SM_OK) return status;
    std::vector<double> x;
    for (Index i = 0; i < a.rows; ++i) x.push_back(row.value(i));
    Wanted y(a.rows);
    const SmStatus solved = model_solve(a, x.data(), y);
    if (solved != SM_OK) return solved;
    sum.add(y.value(j));
    sum.widen(y.slack(j));
  }
  return SM_OK;
}

void call_trace_of_quotient(Machine& m) {
  Model* a = solvable(m);
  Model* b = a && m.random.chance(80) ? m.any([&](const Model& y) { return y.rows == a->rows; }) : m.any();
  if (!a || !b) return;
  const Index start = m.random.chance(60) ? 0 : m.random.below(a->rows + 2) - 1;
  double result = 0;
  m.begin("qxsmtraceinvAB", *a, *b, start);
  const SmStatus got = qxsmtraceinvAB(a->handle, b->handle, start, &result);
  SmStatus status = SM_OK;
  if ((a->empty() && b->empty()) || a->none() || b->none())
    status = SM_NOTHING_TO_REPORT;
  else if (!a->closed() || !b->closed())
    status = SM_NOT_CLOSED;
  else if (a->rows != a->cols || a->rows != b->rows)
    status = SM_NOT_SQUARE;
  else if (a->general() || a->state == SM_STATE_INVERTED)
    status = SM_UNAVAILABLE;
  else if (a->state < SM_STATE_FACTORED)
    status = model_factor(*a, false);
  if (status != SM_OK) {
    m.answer(got, status);
    if (!is_missing(result)) m.wrong("the result is not the missing value");
    return;
  }
  settle(m, *a);
  Sum sum;
  m.answer(got, sum_of_solves(*a, *b, start, sum));
  m.same(result, sum.value(), sum.slack(), "trace");
}

}  // namespace

void add_inverse_form_calls(std::vector<Call>& list) {
  list.insert(list.end(), {{call_invquadv, 8}, {call_invbilin, 8}, {call_trace_of_quotient, 10}});
}

}  // namespace sm::test
