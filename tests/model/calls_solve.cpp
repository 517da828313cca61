// Solves, inversion, the diagonal of the inverse.
#include <cmath>

#include "model/machine.hpp"

namespace sm::test {

namespace {

// A^- b with the factor that is there.
Solution solve(const Model& m, const double* b) {
  if (m.sparse()) return solve_sparse(m.factor, m.perm, b);
  if (m.symmetric()) return solve_packed(m.second(), b);
  Solution out;
  for (Index i = 0; i < m.rows; ++i) {
    const double s = m.second()(i, i);
    out.x.push_back(s > 0 ? b[i] / (s * s) : 0.0);
    out.slack.push_back(8 * kEps * std::fabs(out.x.back()));
  }
  return out;
}

// G b with an inverse that is there.
Solution multiply(const Model& m, const Values& g, const double* b) {
  Solution out;
  for (Index i = 0; i < m.rows; ++i) {
    Sum sum;
    for (Index j = 0; j < m.rows; ++j) sum.add(m.diagonal() && i != j ? 0 : g(std::min(i, j), std::max(i, j)), b[j]);
    out.x.push_back(sum.value());
    out.slack.push_back(sum.slack());
  }
  return out;
}

void store(Wanted& want, Index vector, const Solution& s) {
  const Index n = static_cast<Index>(s.x.size());
  for (Index i = 0; i < n; ++i)
    want.set(vector * n + i, s.x[static_cast<std::size_t>(i)], s.slack[static_cast<std::size_t>(i)]);
}

SmStatus want_subst(const Model& x, const double* b, bool same, Index count, Wanted& want) {
  if (const auto status = not_readable(x)) return *status;
  if (x.state != SM_STATE_FACTORED) return SM_WRONG_STATE;
  if (same) return SM_BAD_ARGUMENT;
  if (x.symmetric()) want.clear(x.rows);
  for (Index k = 0; k < count; ++k) store(want, k, solve(x, b + k * x.rows));
  return SM_OK;
}

}  // namespace

void settle(Machine& m, Model& x) {
  const std::string text = difference(x);
  if (!text.empty()) m.wrong("record " + std::to_string(m.number(x)) + ": " + text + "\n  model: " + describe(x));
}

SmStatus model_solve(const Model& x, const double* b, Wanted& want) { return want_subst(x, b, false, 1, want); }

SmStatus model_inverse_product(Machine& m, Model& x, const double* b, bool same, Index count, Wanted& want) {
  if (const auto status = not_readable(x)) return *status;
  if (x.state >= SM_STATE_FACTORED && x.in_place()) return SM_NO_FACTOR;
  if (same) return SM_BAD_ARGUMENT;
  if (x.rows != x.cols) return SM_NOT_SQUARE;
  want.clear(x.rows * std::max<Index>(count, 0));
  if (x.general()) return SM_UNAVAILABLE;
  if (x.state == SM_STATE_INVERTED) {
    if (x.symmetric() && x.format == SM_FORMAT_COLUMNS) return SM_WRONG_STATE;
    for (Index k = 0; k < count; ++k) store(want, k, multiply(x, x.w, b + k * x.rows));
    return SM_OK;
  }
  const bool fresh = x.state < SM_STATE_FACTORED;
  const SmStatus status = model_factor(x, false);
  if (fresh) settle(m, x);
  if (status != SM_OK) return status;
  return want_subst(x, b, false, count, want);
}

Model* solvable(Machine& m) {
  Model* x =
      m.random.chance(85) ? m.any([](const Model& y) { return y.closed() && !y.general() && !y.empty(); }) : m.any();
  return x && factor_is_clear(*x) && !x->spoiled ? x : nullptr;
}

namespace {

struct Sides {
  Index count;
  bool same;  // x is b
  std::vector<double> b;
  std::vector<double> x;
};

Sides draw_sides(Machine& m, const Model& model) {
  Sides s{m.random.below(4) - (m.random.chance(5) ? 1 : 0), m.random.chance(3), {}, {}};
  s.b = m.dyadics(model.rows * 4 + 4);
  s.x = m.blank(model.rows * 4 + 4);
  return s;
}

void finish(Machine& m, const Sides& s, const Wanted& want) {
  if (!s.same) m.output(s.x.data(), want);
}

void call_subst(Machine& m) {
  Model* x = m.random.chance(70) ? m.any([](const Model& y) { return y.state == SM_STATE_FACTORED; }) : m.any();
  if (!x || x->spoiled) return;
  Sides s = draw_sides(m, *x);
  m.begin("qxsmsubst", *x, s.count, s.same);
  Wanted want(x->rows * 4 + 4);
  const SmStatus got =
      m.fn().qxsmsubst(x->handle, s.b.data(), s.same ? s.b.data() : s.x.data(), static_cast<int>(s.count));
  m.answer(got, want_subst(*x, s.b.data(), s.same, s.count, want));
  finish(m, s, want);
}

void call_invmultv(Machine& m) {
  Model* x = solvable(m);
  if (!x) return;
  Sides s = draw_sides(m, *x);
  m.begin("qxsminvmultv", *x, s.count, s.same);
  const SmStatus got = qxsminvmultv(x->handle, s.b.data(), s.same ? s.b.data() : s.x.data(), s.count);
  Wanted want(x->rows * 4 + 4);
  m.answer(got, model_inverse_product(m, *x, s.b.data(), s.same, s.count, want));
  finish(m, s, want);
}

SmStatus solve_diagonal(Model& x, const Sides& s, Wanted& want) {
  x.definite = 1;
  for (Index k = 0; k < s.count; ++k)
    for (Index i = 0; i < x.rows; ++i) {
      const double d = x.v(i, i);
      if (d < -0.0001) {
        x.definite = 0;
        want = Wanted(want.size());  // x is untouched on every failure
        return SM_NOT_DEFINITE;
      }
      const Index at = k * x.rows + i;
      want.set(at, d > kTolerance ? s.b[static_cast<std::size_t>(at)] / d : 0.0);
    }
  return SM_OK;
}

// The packed road of the one-call solve: the array becomes the generalized inverse.
SmStatus invert_packed(Model& x, double tolerance) {
  if (x.state == SM_STATE_INVERTED) return SM_OK;
  Values r = x.second();
  if (x.state < SM_STATE_FACTORED) {
    const Elimination e = eliminate(x.v, natural_order(x.rows), tolerance);
    x.definite = kUnknown;  // the one-call solve says nothing about it
    x.takes_cached = !e.definite;
    if (!e.definite) return SM_NOT_DEFINITE;
    r = packed_factor(e);
  }
  const Inverse inverse = inverse_of_factor(r);
  (x.separate ? x.w : x.v) = inverse.g;
  (x.separate ? x.separate_slack : x.slack) = inverse.slack;
  x.rank = inverse.rank;
  x.log_det = static_cast<double>(inverse.log_det);
  x.state = SM_STATE_INVERTED;
  return SM_OK;
}

}  // namespace

bool inverse_is_clear(const Model& x, double tolerance) {
  if (!x.packed() || !x.closed() || x.empty() || x.state == SM_STATE_INVERTED) return true;
  if (x.state == SM_STATE_FACTORED) return inverse_of_factor(x.second()).clear;
  const Elimination e = eliminate(x.v, natural_order(x.rows), tolerance);
  return e.clear && (!e.definite || inverse_of_factor(packed_factor(e)).clear);
}

namespace {

void call_direct(Machine& m) {
  Model* x = solvable(m);
  if (!x) return;
  // An open matrix is closed first, dropping nothing; whether its pivots are clear is asked of the closed one.
  Model closed = *x;
  model_close(closed, kNan);
  if (!factor_is_clear(closed) || !inverse_is_clear(closed)) return;
  Sides s = draw_sides(m, *x);
  m.begin("qxsmsoldirect", *x, s.count, s.same);
  double* to = s.same ? s.b.data() : s.x.data();
  const SmStatus got = m.fn().qxsmsoldirect(x->handle, s.b.data(), to, static_cast<int>(s.count));
  Wanted want(x->rows * 4 + 4);
  if (x->empty()) return m.answer(got, SM_OK), finish(m, s, want);
  if (s.same) return m.answer(got, SM_BAD_ARGUMENT);
  model_close(*x, kNan);
  if (x->general()) return m.answer(got, SM_UNAVAILABLE), finish(m, s, want);
  SmStatus status = SM_OK;
  if (x->diagonal()) {
    status = solve_diagonal(*x, s, want);
    m.answer(got, status);
    return finish(m, s, want);
  }
  status = x->sparse() ? model_factor(*x, false) : invert_packed(*x, kTolerance);
  settle(m, *x);
  m.answer(got, status);
  if (status != SM_OK) return;
  if (x->sparse())
    want_subst(*x, s.b.data(), false, s.count, want);
  else
    for (Index k = 0; k < s.count; ++k) store(want, k, multiply(*x, x->second(), s.b.data() + k * x->rows));
  finish(m, s, want);
}

Solution inverse_diagonal_of(const Model& x) {
  if (x.sparse()) return inverse_diagonal(x.factor, x.perm);
  Solution out;
  const Inverse inverse = x.packed() && x.state < SM_STATE_INVERTED ? inverse_of_factor(x.second()) : Inverse();
  for (Index i = 0; i < x.rows; ++i) {
    const bool from_factor = x.packed() && x.state < SM_STATE_INVERTED;
    out.x.push_back(from_factor ? inverse.g(i, i) : x.second()(i, i));
    out.slack.push_back(from_factor ? inverse.slack : 0.0);
  }
  return out;
}

void call_inverse_diagonal(Machine& m) {
  Model* x = solvable(m);
  if (!x || !inverse_is_clear(*x)) return;
  std::vector<double> out = m.blank(x->rows + 2);
  Wanted want(x->rows + 2);
  m.begin("qxsminvdiag", *x);
  const SmStatus got = m.fn().qxsminvdiag(x->handle, out.data());
  SmStatus status = SM_OK;
  if (const auto refused = not_readable(*x)) {
    status = *refused;
  } else if (x->rows != x->cols) {
    status = SM_NOT_SQUARE;
  } else {
    want.clear(x->rows);
    status = x->general() ? SM_UNAVAILABLE : x->state < SM_STATE_FACTORED ? model_factor(*x, false) : SM_OK;
    settle(m, *x);
    if (status == SM_OK) store(want, 0, inverse_diagonal_of(*x));
  }
  m.answer(got, status);
  m.output(out.data(), want);
}

void move_separate(Model& x) {
  x.v = x.w;
  x.separate = false;
  x.lent = nullptr;
}

SmStatus invert_diagonal(Model& x, Values& d, double tolerance) {
  if (x.state == SM_STATE_FACTORED) {
    for (Index i = 0; i < x.rows; ++i)
      if (d(i, i) > 0) d(i, i) = 1 / (d(i, i) * d(i, i));
    return SM_OK;
  }
  x.rank = 0;
  x.log_det = 0;
  x.definite = 1;
  for (Index i = 0; i < x.rows; ++i) {
    if (d(i, i) >= tolerance) {
      x.log_det += std::log(d(i, i));
      x.rank += 1;
      d(i, i) = 1 / d(i, i);
    } else if (d(i, i) < -0.0001) {
      x.void_results();
      x.definite = 0;
      return SM_NOT_DEFINITE;
    } else {
      d(i, i) = 0;
    }
  }
  return SM_OK;
}

}  // namespace

SmStatus model_invert(Model& x, bool in_place, double tolerance) {
  if (const auto status = not_readable(x)) return *status;
  const bool factored = x.state >= SM_STATE_FACTORED;
  if (!x.sparse() && factored && !x.separate && !in_place) return SM_NO_FACTOR;
  if (x.state == SM_STATE_INVERTED) {
    if (in_place && x.separate) move_separate(x);
    return SM_OK;
  }
  if (x.rows != x.cols) return SM_NOT_SQUARE;
  if (x.sparse() || x.general()) return SM_UNAVAILABLE;
  if (factored && x.separate && in_place) move_separate(x);
  if (!factored) x.separate = !in_place;
  if (!factored && !in_place) x.w = x.v;
  x.leftover = true;  // unless it ends well
  Values& target = x.separate ? x.w : x.v;
  if (x.diagonal()) {
    const SmStatus status = invert_diagonal(x, target, std::isnan(tolerance) ? kTolerance : tolerance);
    if (status != SM_OK) return status;
    (x.separate ? x.separate_slack : x.slack) = 1e-13;
  } else {
    const Index rank = x.rank;
    const double log_det = x.log_det;
    const int definite = x.definite;
    const SmStatus status = invert_packed(x, std::isnan(tolerance) ? kTolerance : tolerance);
    if (status != SM_OK) return status;
    x.definite = factored ? definite : 1;
    if (factored) x.rank = rank, x.log_det = log_det;
  }
  x.state = SM_STATE_INVERTED;
  x.leftover = false;
  return SM_OK;
}

namespace {

void call_invert(Machine& m) {
  Model* x = solvable(m);
  const bool in_place = m.random.chance(50);
  const double tolerance = m.random.chance(50) ? 0.25 : kNan;
  if (!x || !inverse_is_clear(*x, std::isnan(tolerance) ? kTolerance : tolerance)) return;
  m.begin("qxsminv", *x, in_place, tolerance);
  const SmStatus got = m.fn().qxsminv(x->handle, in_place ? 1 : 0, tolerance);
  m.answer(got, model_invert(*x, in_place, tolerance));
}

}  // namespace

void add_solve_calls(std::vector<Call>& list) {
  list.insert(list.end(),
              {{call_subst, 14}, {call_invmultv, 10}, {call_direct, 6}, {call_inverse_diagonal, 7}, {call_invert, 6}});
}

}  // namespace sm::test
