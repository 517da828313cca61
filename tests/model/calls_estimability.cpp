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
  if (!a || a->spoiled || !factor_is_clear(*a)) return;
  const Index k = m.random.below(4);
  const char mode = m.random.chance(a->general() ? 90 : 5) ? 'H' : 'G';
  std::vector<double> x = m.dyadics(kBlock);
  // A vector with one element 1, or A's own column, is estimable more often than one of random elements.
  for (Index v = 0; v < k; ++v) {
    const Index pick = m.random.below(a->rows + 1);
    for (Index i = 0; i < a->rows && m.random.chance(90); ++i)
      if (m.random.chance(50) && pick < a->cols) x[static_cast<std::size_t>(v * a->rows + i)] = a->at(i, pick);
  }
  std::int32_t flags[4] = {7, 7, 7, 7};
  Index failed = -1;
  const bool flagged = m.random.chance(80);
  m.begin("qxsmcke", *a, k, mode, flagged);
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
      h.slack = std::max(h.slack, y.slack(i) + 2 * kDropped);
      if (h.sparse() && std::fabs(std::fabs(y.value(i)) - kDropped) <= 2 * y.slack(i)) {
        h.leave_open(i, j);
        continue;
      }
      if (std::fabs(y.value(i)) > kDropped || h.dense()) h.set(i, j, y.value(i));
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

void call_hermite(Machine& m) {
  Model* a = solvable(m);
  Model* h = m.other({a}, [&](const Model& y) { return y.general() || m.random.chance(15); });
  if (!a || !h || !inverse_is_clear(*a)) return;
  m.begin("qxsmhermite", *a, *h);
  const SmStatus got = m.fn().qxsmhermite(a->handle, h->handle);
  m.answer(got, model_hermite(m, *a, *h));
}

// What the callback was told, and when it stops the solve.
struct Progress {
  Index last = 0;
  Index stop = -1;
  Index word = 0;
};

std::int32_t follow(void* context, double, std::int64_t word, std::int64_t iteration) {
  auto& progress = *static_cast<Progress*>(context);
  progress.word = word;
  progress.last = std::max(progress.last, iteration);
  return iteration == progress.stop;
}

bool dominant(const Model& a) {
  for (Index i = 0; i < a.rows; ++i) {
    double rest = 0.5;
    for (Index j = 0; j < a.rows; ++j) rest += i == j ? 0 : std::fabs(a.at(i, j));
    if (a.at(i, i) <= rest) return false;
  }
  return true;
}

bool has_negative_diagonal(const Model& a) {
  for (Index i = 0; i < a.rows; ++i)
    if (a.at(i, i) < -0.1) return true;
  return false;
}

struct Iteration {
  Index nrhs = 0;
  Index limit = 500;
  Progress progress;
  std::vector<double> b, x;
  Index steps = -7;
  double residual = -7;
};

void check_solution(Machine& m, const Model& a, const Iteration& t) {
  for (Index k = 0; k < t.nrhs; ++k)
    for (Index i = 0; i < a.rows; ++i) {
      Sum sum;
      for (Index j = 0; j < a.rows; ++j) sum.add(a.at(i, j), t.x[static_cast<std::size_t>(k * a.rows + j)]);
      m.same(sum.value(), t.b[static_cast<std::size_t>(k * a.rows + i)], 1e-4, "A x");
    }
}

void check_quotients(Machine& m, const Model& a, const Iteration& t) {
  for (Index i = 0; i < t.nrhs * a.rows; ++i) {
    const double d = a.v(i % a.rows, i % a.rows);
    const double want = std::fabs(d) <= kDropped ? 0.0 : t.b[static_cast<std::size_t>(i)] / d;
    m.same(t.x[static_cast<std::size_t>(i)], want, 4 * kEps * std::fabs(want), "x");
  }
}

void check_iteration(Machine& m, const Model& a, const Iteration& t, SmStatus got, SmStatus want) {
  const bool refused = want == SM_UNTYPED || want == SM_NOT_CLOSED || want == SM_BAD_ARGUMENT;
  if (a.empty() || refused) {
    if (t.steps != -7 || t.residual != -7) m.wrong("a refused call has written its outputs");
  } else if (!a.symmetric() || want == SM_NOT_DEFINITE || t.nrhs < 1) {
    if (t.steps != 0 || (want != SM_NOT_DEFINITE && t.residual != 0)) m.wrong("iterations and residual");
    if (a.diagonal() && want == SM_OK) check_quotients(m, a, t);
  } else {
    const Index limit = t.limit < 1 ? a.rows + 2 : t.limit;
    if (t.progress.last > 0 && t.progress.word != a.word) m.wrong("another user word was told");
    if (t.steps < 0 || t.steps > limit || t.progress.last < t.steps) m.wrong("steps that were not told");
    if (got == SM_OK && dominant(a)) check_solution(m, a, t);
  }
}

// Whether the steps are enough is predicted for dominant matrices, many steps and nobody who stops them.
SmStatus want_iteration(const Model& a, const Iteration& t, bool same, SmStatus got) {
  if (const auto refused = not_readable(a)) return *refused;
  if (same) return SM_BAD_ARGUMENT;
  if (a.general()) return SM_UNAVAILABLE;
  if (a.diagonal() || t.nrhs < 1) return SM_OK;
  if (has_negative_diagonal(a)) return SM_NOT_DEFINITE;
  if (t.progress.stop >= 0) return t.progress.last >= t.progress.stop ? SM_NOT_CONVERGED : SM_OK;
  const bool told = dominant(a) && t.limit == 500;
  return !told && got == SM_NOT_CONVERGED ? got : SM_OK;
}

void call_iterative(Machine& m) {
  Model* a = m.any([&](const Model& y) { return !y.general() || m.random.chance(10); });
  if (!a) return;
  Iteration t;
  t.nrhs = m.random.below(4) - (m.random.chance(5) ? 1 : 0);
  if (m.random.chance(20)) t.limit = m.random.below(3);
  if (t.limit == 500 && dominant(*a) && m.random.chance(10)) t.progress.stop = 1;
  const bool same = m.random.chance(3);
  if (!a->none()) a->word = a->handle->solver_word = m.random.below(100);
  t.b = m.dyadics(kBlock);
  t.x = m.blank(kBlock);
  m.begin("qxsmsetprogress");
  m.answer(qxsmsetprogress(m.instance(), follow, &t.progress), SM_OK);
  m.begin("qxsmsolioc", *a, t.nrhs, t.limit, same);
  const SmStatus got = m.fn().qxsmsolioc(a->handle, t.b.data(), same ? t.b.data() : t.x.data(),
                                         static_cast<int>(t.nrhs), t.limit, &t.steps, &t.residual, 1e-9);
  const SmStatus want = want_iteration(*a, t, same, got);
  m.answer(got, want);
  check_iteration(m, *a, t, got, want);
  m.begin("qxsmsetprogress");
  m.answer(qxsmsetprogress(m.instance(), nullptr, nullptr), SM_OK);
}

}  // namespace

void add_estimability_calls(std::vector<Call>& list) {
  list.insert(list.end(), {{call_estimable, 12}, {call_hermite, 14}, {call_iterative, 8}});
}

}  // namespace sm::test
