// Products with vectors, quadratic and bilinear forms of vectors.
#include "model/machine.hpp"

namespace sm::test {

namespace {

struct Product {
  Index r0, r1, c0, c1, k;
  bool accumulate, same;
};

SmStatus want_product(const Model& a, const Product& p, const double* x, Wanted& y) {
  if (const auto status = not_readable(a)) return *status;
  if (p.same || p.r0 < 0 || p.c0 < 0 || p.r1 >= a.rows || p.c1 >= a.cols || p.r0 > p.r1 || p.c0 > p.c1)
    return SM_BAD_ARGUMENT;
  const Index height = p.r1 - p.r0 + 1;
  const Index width = p.c1 - p.c0 + 1;
  if (!p.accumulate && p.k > 0) y.clear(height * p.k);
  if (p.k < 1) return SM_OK;
  const bool whole = height == a.rows && width == a.cols;
  if (a.packed() && a.format == SM_FORMAT_COLUMNS && !whole) return SM_UNAVAILABLE;
  if (a.symmetric_sparse() && a.state > SM_STATE_CLOSED && !whole) return SM_REORDERED;
  const bool passes = a.diagonal() && p.c0 < p.r0 && p.c1 > p.r1;
  for (Index v = 0; v < p.k; ++v)
    for (Index i = 0; i < height; ++i) {
      Sum sum;
      if (p.accumulate) sum.add(Wanted::kUntouched);
      for (Index j = 0; j < width && !passes; ++j) sum.add(a.at(p.r0 + i, p.c0 + j), x[v * width + j]);
      y.set(v * height + i, sum);
    }
  return SM_OK;
}

void call_multv(Machine& m) {
  Model* a = m.any();
  if (!a) return;
  Product p{0,
            a->rows - 1,
            0,
            a->cols - 1,
            m.random.below(4) - (m.random.chance(3) ? 1 : 0),
            m.random.chance(40),
            m.random.chance(3)};
  if (m.random.chance(50) && a->rows > 0 && a->cols > 0) {
    p.r0 = m.random.below(a->rows + 1) - (m.random.chance(4) ? 1 : 0);
    p.r1 = p.r0 + m.random.below(a->rows) - (m.random.chance(4) ? 1 : 0);
    p.c0 = m.random.below(a->cols) - (m.random.chance(4) ? 1 : 0);
    p.c1 = p.c0 + m.random.below(a->cols);
  }
  if (m.random.chance(2)) (m.random.chance(50) ? p.r1 : p.c0) = m.place(a->rows);
  std::vector<double> x = m.dyadics(kBlock);
  std::vector<double> y = m.blank(kBlock);
  m.begin("qxsmmultv", *a, p.r0, p.r1, p.c0, p.c1, p.k, p.accumulate, p.same);
  double* to = p.same ? x.data() : y.data();
  const SmStatus got = qxsmmultv(a->handle, x.data(), to, p.r0, p.r1, p.c0, p.c1, p.k, p.accumulate);
  Wanted want(kBlock);
  m.answer(got, want_product(*a, p, x.data(), want));
  m.output(y.data(), want);
}

void call_vmult(Machine& m) {
  Model* a = m.any();
  if (!a) return;
  const Index k = m.random.below(4) - (m.random.chance(3) ? 1 : 0);
  const bool accumulate = m.random.chance(40);
  const bool same = m.random.chance(3);
  std::vector<double> x = m.dyadics(kBlock);
  std::vector<double> y = m.blank(kBlock);
  m.begin("qxsmvmult", *a, k, accumulate, same);
  const SmStatus got = qxsmvmult(x.data(), a->handle, same ? x.data() : y.data(), k, accumulate);
  Wanted want(kBlock);
  SmStatus status = same ? SM_BAD_ARGUMENT : SM_OK;
  if (const auto refused = not_readable(*a)) {
    status = *refused;
  } else if (!same) {
    for (Index v = 0; v < k; ++v)
      for (Index j = 0; j < a->cols; ++j) {
        Sum sum;
        if (accumulate) sum.add(Wanted::kUntouched);
        for (Index i = 0; i < a->rows; ++i) sum.add(a->at(i, j), x[static_cast<std::size_t>(v * a->rows + i)]);
        want.set(v * a->cols + j, sum);
      }
  }
  m.answer(got, status);
  m.output(y.data(), want);
}

// x' A[c0..c1, c0..c1] y, component i of a vector standing for row c0 + i.
Sum form(const Model& a, const double* x, const double* y, Index c0, Index c1) {
  Sum sum;
  for (Index i = c0; i <= c1; ++i)
    for (Index j = c0; j <= c1; ++j) sum.add(x[i - c0], a.at(i, j), y[j - c0]);
  return sum;
}

void call_quadv(Machine& m) {
  Model* a = m.any();
  if (!a) return;
  const Index p = m.random.below(4);
  Index c0 = 0;
  Index c1 = a->rows - 1;
  if (m.random.chance(50)) {
    c0 = m.random.below(a->rows + 1) - (m.random.chance(4) ? 1 : 0);
    c1 = c0 + m.random.below(a->rows + 1) - (m.random.chance(4) ? 1 : 0);
    if (m.random.chance(3)) c1 = m.place(a->rows);
  }
  const std::vector<double> x = m.dyadics(kBlock);
  std::vector<double> r = m.blank(16);
  m.begin("qxsmquadv", *a, p, c0, c1);
  const SmStatus got = m.fn().qxsmquadv(a->handle, x.data(), r.data(), p, c0, c1);
  Wanted want(16);
  SmStatus status = SM_OK;
  if (const auto refused = not_readable(*a)) {
    status = *refused;
  } else if (a->rows != a->cols) {
    status = SM_NOT_SQUARE;
  } else if (c0 < 0 || c1 >= a->rows || c0 > c1) {
    status = SM_DIMENSION_MISMATCH;
  } else {
    const Index n = c1 - c0 + 1;
    for (Index j = 0; j < p; ++j)
      for (Index i = 0; i <= j; ++i)
        want.set(j * (j + 1) / 2 + i, form(*a, x.data() + i * n, x.data() + j * n, c0, c1));
  }
  m.answer(got, status);
  m.output(r.data(), want);
}

void call_bilin(Machine& m) {
  Model* a = m.any();
  if (!a) return;
  const Index p = m.random.below(4);
  const Index q = m.random.below(4);
  const bool same = m.random.chance(3);
  std::vector<double> x = m.dyadics(kBlock);
  const std::vector<double> y = m.dyadics(kBlock);
  std::vector<double> r = m.blank(16);
  m.begin("qxsmbilin", *a, p, q, same);
  const SmStatus got = m.fn().qxsmbilin(a->handle, x.data(), y.data(), same ? x.data() : r.data(), p, q);
  Wanted want(16);
  SmStatus status = SM_OK;
  if (const auto refused = not_readable(*a)) {
    status = *refused;
  } else if (a->rows != a->cols) {
    status = SM_NOT_SQUARE;
  } else if (same) {
    status = SM_BAD_ARGUMENT;
  } else {
    want.clear(p * q);
    if (a->general()) status = SM_UNAVAILABLE;
    for (Index j = 0; j < q && !a->general(); ++j)
      for (Index i = 0; i < p; ++i)
        want.set(i + j * p, form(*a, x.data() + i * a->rows, y.data() + j * a->rows, 0, a->rows - 1));
  }
  m.answer(got, status);
  m.output(r.data(), want);
}

}  // namespace

void add_form_calls(std::vector<Call>& list) {
  list.insert(list.end(), {{call_multv, 14}, {call_vmult, 8}, {call_quadv, 8}, {call_bilin, 6}});
}

}  // namespace sm::test
