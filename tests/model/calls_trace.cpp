// Traces.
#include "model/machine.hpp"

namespace sm::test {

namespace {

void check_result(Machine& m, double got, const std::optional<Sum>& want) {
  if (want)
    m.same(got, want->value(), want->slack(), "trace");
  else if (!is_missing(got))
    m.wrong("the result is not the missing value");
}

void call_trace(Machine& m) {
  Model* x = m.any();
  if (!x) return;
  double result = 0;
  m.begin("qxsmtrace", *x);
  const SmStatus got = m.fn().qxsmtrace(x->handle, &result);
  std::optional<Sum> want;
  SmStatus status = SM_OK;
  if (x->empty()) {
    status = SM_NOTHING_TO_REPORT;
  } else if (!x->closed()) {
    status = SM_NOT_CLOSED;
  } else {
    want.emplace();
    for (Index i = 0; i < std::min(x->rows, x->cols); ++i) want->add(x->at(i, i));
  }
  m.answer(got, status);
  check_result(m, result, want);
}

bool pair_is_served(const Model& a, const Model& b) {
  if (a.diagonal()) return true;
  if (a.general()) return b.general();
  return a.format != SM_FORMAT_COLUMNS || !b.general();
}

void call_trace_of_product(Machine& m) {
  Model* a = m.any();
  Model* b = a && m.random.chance(70) ? m.any([&](const Model& y) { return y.rows == a->cols; }) : m.any();
  if (!a || !b) return;
  double result = 0;
  m.begin("qxsmtraceAB", *a, *b);
  const SmStatus got = m.fn().qxsmtraceAB(a->handle, b->handle, &result);
  std::optional<Sum> want;
  SmStatus status = SM_OK;
  if ((a->empty() && b->empty()) || a->none() || b->none()) {
    status = SM_NOTHING_TO_REPORT;
  } else if (!a->closed() || !b->closed()) {
    status = SM_NOT_CLOSED;
  } else if (a->cols != b->rows) {
    status = SM_DIMENSION_MISMATCH;
  } else if (!pair_is_served(*a, *b)) {
    status = SM_UNAVAILABLE;
  } else if (!(a->symmetric_sparse() && b->symmetric_sparse() && b->state > SM_STATE_ORDERED) || b->empty()) {
    want.emplace();
    for (Index i = 0; i < std::min(a->rows, b->cols); ++i)
      for (Index j = 0; j < a->cols; ++j) want->add(a->at(i, j), b->at(j, i));
  }
  m.answer(got, status);
  // A refused pair of kinds may leave the sum of nothing behind.
  if (status != SM_UNAVAILABLE || result != 0) check_result(m, result, want);
}

}  // namespace

void add_trace_calls(std::vector<Call>& list) {
  list.insert(list.end(), {{call_trace, 6}, {call_trace_of_product, 10}});
}

}  // namespace sm::test
