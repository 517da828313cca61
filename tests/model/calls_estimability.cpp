// Estimability, Hermite forms, the iterative solver.
#include <cmath>

#include "model/machine.hpp"

namespace sm::test {

namespace {

// z = A A^- x, or x H; false when it cannot be had, with the answer.
struct Projected {
  SmStatus status = SM_OK;
  std::vector<Sum> z;
};

Projected project(Machine& m, Model& a, const double* x, char mode) {
  Projected out;
  std::vector<Sum> z(static_cast<std::size_t>(a.rows));
  Wanted w(a.rows + 1);
  if (mode != 'H') out.status = model_inverse_product(m, a, x, false, 1, w);
  if (out.status != SM_OK) return out;
  for (Index i = 0; i < a.rows; ++i)
    for (Index j = 0; j < a.rows; ++j) {
      Sum& sum = z[static_cast<std::size_t>(i)];
      if (mode == 'H') {
        sum.add(x[j], a.at(j, i));
      } else {
        sum.add(a.at(i, j), w.value(j));
        sum.widen(std::fabs(a.at(i, j)) * w.slack(j));
      }
    }
  out.z = z;
  return out;
}

// 1 failed, 0 passed, -1 too near to tell.
int judge(const Projected& p, const double* x, double tolerance) {
  double largest = 0;
  for (std::size_t i = 0; i < p.z.size(); ++i) largest = std::max(largest, std::fabs(x[i]));
  int verdict = 0;
  for (std::size_t i = 0; i < p.z.size(); ++i) {
    const double away = std::fabs(x[i] - p.z[i].value()) - tolerance * largest;
    const double slack = p.z[i].slack() + 1e-12 * largest;
    if (away > slack) return 1;
    if (away > -slack && largest > 0) verdict = -1;
  }
  return verdict;
}

struct Estimable {
  Index failed = 0;
  std::vector<std::int32_t> flags;
  bool told = true;
};

SmStatus want_estimable(Machine& m, Model& a, const std::vector<double>& x, Index k, char mode, Estimable& want) {
  want.failed = k;
  want.flags.assign(static_cast<std::size_t>(k), 1);
  if (a.empty()) return SM_OK;
  if (a.none() || !a.closed() || a.rows != a.cols) return SM_NOT_CLOSED;
  if (k < 1 || (mode == 'H' ? !a.general_sparse() : !a.symmetric())) return SM_OK;
  SmStatus last = SM_OK;
  for (Index v = 0; v < k; ++v) {
    const double* vector = x.data() + v * a.rows;
    const Projected p = project(m, a, vector, mode);
    last = p.status;
    const int verdict = p.status == SM_OK ? judge(p, vector, 1e-6) : 1;
    want.told = want.told && verdict >= 0;
    if (verdict != 0) continue;
    want.failed -= 1;
    want.flags[static_cast<std::size_t>(v)] = 0;
  }
  return last;
}

void call_estimable(Machine& m) {
  Model* a = m.random.chance(70) ? solvable(m) : m.any([](const Model& y) { return y.general_sparse(); });
  if (!a) return;
  const Index k = m.random.below(4);
  const char mode = a->general() || m.random.chance(5) ? 'H' : 'G';
  std::vector<double> x = m.dyadics(64);
  // A vector with one element 1, or A's own column, is estimable more often than one of random elements.
  for (Index v = 0; v < k; ++v) {
    const Index pick = m.random.below(a->rows + 1);
    for (Index i = 0; i < a->rows && m.random.chance(90); ++i)
      if (m.random.chance(50) && pick < a->cols) x[static_cast<std::size_t>(v * a->rows + i)] = a->at(i, pick);
  }
  std::int32_t flags[4] = {7, 7, 7, 7};
  Index failed = -1;
  const bool flagged = m.random.chance(80);
  m.begin("qxsmcke", m.number(*a), k, mode, flagged);
  const SmStatus got =
      m.fn().qxsmcke(a->handle, x.data(), static_cast<int>(k), &failed, flagged ? flags : nullptr, mode, 1e-6);
  Estimable want;
  m.answer(got, want_estimable(m, *a, x, k, mode, want));
  if (!want.told) return;
  if (failed != want.failed) m.wrong("failed vectors " + std::to_string(failed));
  for (Index v = 0; v < k && flagged; ++v)
    if (flags[v] != want.flags[static_cast<std::size_t>(v)]) m.wrong("flag " + std::to_string(v));
}

constexpr double kDropped = 1.110223024625157e-12;

SmStatus enter_columns(const Model& a, Model& h) {
  for (Index j = 0; j < a.rows; ++j) {
    std::vector<double> x;
    for (Index i = 0; i < a.rows; ++i) x.push_back(a.at(i, j));
    Wanted y(a.rows);
    const SmStatus status = model_solve(a, x.data(), y);
    if (status != SM_OK) return status;
    for (Index i = 0; i < a.rows; ++i) {
      if (std::fabs(y.value(i)) <= kDropped && h.sparse()) continue;
      h.set(i, j, y.value(i));
      h.slack = std::max(h.slack, y.slack(i) + 2 * kDropped);
    }
  }
  h.changed();
  return SM_OK;
}

void multiply_inverse(const Model& a, Model& h) {
  for (Index i = 0; i < a.rows; ++i)
    for (Index j = 0; j < a.rows; ++j) {
      Sum sum;
      for (Index k = 0; k < a.rows; ++k) sum.add(a.w(std::min(i, k), std::max(i, k)), a.at(k, j));
      h.set(i, j, sum.value());
      h.slack = std::max(h.slack, sum.slack());
    }
  h.changed();
}

SmStatus model_hermite(Machine& m, Model& a, Model& h) {
  if (const auto status = not_readable(a)) return *status;
  if (&a == &h) return SM_BAD_ARGUMENT;
  if (a.rows != a.cols) return SM_NOT_SQUARE;
  model_resize(h, a.rows, a.rows);
  if (a.general()) return SM_UNAVAILABLE;
  if (!h.general() && !(a.diagonal() && h.diagonal())) return SM_KIND_MISMATCH;
  const SmStatus status = a.sparse() ? model_factor(a, false) : model_invert(a, false, kNan);
  settle(m, a);
  if (status != SM_OK) return a.diagonal() ? SM_NO_ELEMENT : status;
  if (a.sparse()) return enter_columns(a, h);
  if (a.symmetric()) multiply_inverse(a, h);
  for (Index i = 0; i < a.rows && a.diagonal(); ++i) model_assign(h, i, i, false, a.w(i, i) * a.v(i, i));
  return SM_OK;
}

// Elements of a sparse result near the limit could be stored or not; asked of a factor that is there.
bool columns_are_clear(const Model& a) {
  for (Index j = 0; j < a.rows; ++j) {
    std::vector<double> x;
    for (Index i = 0; i < a.rows; ++i) x.push_back(a.at(i, j));
    Wanted y(a.rows);
    if (model_solve(a, x.data(), y) != SM_OK) return false;
    for (Index i = 0; i < a.rows; ++i)
      if (std::fabs(std::fabs(y.value(i)) - kDropped) <= 2 * y.slack(i)) return false;
  }
  return true;
}

void call_hermite(Machine& m) {
  Model* a = solvable(m);
  Model* h = m.any([&](const Model& y) { return y.general() || m.random.chance(15); });
  if (!a || !h || !inverse_is_clear(*a)) return;
  // What is answered first for a general A and a result of a wrong kind is not told.
  if (a->general() && !h->general()) return;
  if (a->symmetric_sparse() && h->sparse() && a != h && (a->state != SM_STATE_FACTORED || !columns_are_clear(*a)))
    return;
  m.begin("qxsmhermite", m.number(*a), m.number(*h));
  const SmStatus got = m.fn().qxsmhermite(a->handle, h->handle);
  m.answer(got, model_hermite(m, *a, *h));
}

std::int32_t count_step(void* context, double, std::int64_t, std::int64_t iteration) {
  auto& steps = *static_cast<Index*>(context);
  steps = std::max(steps, iteration);
  return 0;
}

bool dominant(const Model& a) {
  for (Index i = 0; i < a.rows; ++i) {
    double rest = 0.5;
    for (Index j = 0; j < a.rows; ++j) rest += i == j ? 0 : std::fabs(a.at(i, j));
    if (a.at(i, i) <= rest) return false;
  }
  return true;
}

void check_solution(Machine& m, const Model& a, const std::vector<double>& b, const std::vector<double>& x,
                    Index nrhs) {
  for (Index k = 0; k < nrhs; ++k)
    for (Index i = 0; i < a.rows; ++i) {
      Sum sum;
      for (Index j = 0; j < a.rows; ++j) sum.add(a.at(i, j), x[static_cast<std::size_t>(k * a.rows + j)]);
      m.same(sum.value(), b[static_cast<std::size_t>(k * a.rows + i)], 1e-4, "A x");
    }
}

void call_iterative(Machine& m) {
  Model* a = m.any([&](const Model& y) { return !y.general() || m.random.chance(10); });
  // The number of steps, and whether they are enough, is predicted for dominant matrices only.
  if (!a || (a->symmetric() && a->closed() && !dominant(*a))) return;
  const Index nrhs = m.random.below(4) - (m.random.chance(5) ? 1 : 0);
  const bool same = m.random.chance(3);
  std::vector<double> b = m.dyadics(64);
  std::vector<double> x = m.blank(64);
  Index iterations = -7;
  double residual = -7;
  Index steps = 0;
  qxsmsetprogress(m.instance(), count_step, &steps);
  m.begin("qxsmsolioc", m.number(*a), nrhs, same);
  const SmStatus got = m.fn().qxsmsolioc(a->handle, b.data(), same ? b.data() : x.data(), static_cast<int>(nrhs), 500,
                                         &iterations, &residual, 1e-9);
  m.begin("qxsmsetprogress");
  m.answer(qxsmsetprogress(m.instance(), nullptr, nullptr), SM_OK);
  m.begin("qxsmsolioc", m.number(*a), nrhs, same);
  SmStatus status = SM_OK;
  if (const auto refused = not_readable(*a))
    status = *refused;
  else if (same)
    status = SM_BAD_ARGUMENT;
  else if (a->general())
    status = SM_UNAVAILABLE;
  m.answer(got, status);
  if (a->empty() || (status != SM_OK && status != SM_UNAVAILABLE)) {
    if (iterations != -7 || residual != -7) m.wrong("a refused call has written its outputs");
  } else if (status != SM_OK || nrhs < 1) {
    if (iterations != 0 || residual != 0) m.wrong("iterations and residual");
  } else if (a->symmetric()) {
    check_solution(m, *a, b, x, nrhs);
    if (steps < iterations) m.wrong("steps that were not told");
  } else {
    for (Index i = 0; i < nrhs * a->rows; ++i) {
      const double d = a->v(i % a->rows, i % a->rows);
      const double want = std::fabs(d) <= kDropped ? 0.0 : b[static_cast<std::size_t>(i)] / d;
      m.same(x[static_cast<std::size_t>(i)], want, 4 * kEps * std::fabs(want), "x");
    }
  }
}

}  // namespace

void add_estimability_calls(std::vector<Call>& list) {
  list.insert(list.end(), {{call_estimable, 12}, {call_hermite, 12}, {call_iterative, 8}});
}

}  // namespace sm::test
