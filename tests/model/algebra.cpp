#include "model/algebra.hpp"

#include <algorithm>
#include <numeric>
#include <set>

namespace sm::test {

namespace {

// What is left of a matrix after some eliminations, and the error of each element.
struct Rest {
  Reals s;
  Reals e;
};

Rest start(const Values& a) {
  Rest rest{Reals(a.rows(), a.rows()), Reals(a.rows(), a.rows())};
  for (Index i = 0; i < a.rows(); ++i)
    for (Index j = 0; j < a.rows(); ++j) rest.s(i, j) = i <= j ? a(i, j) : a(j, i);
  return rest;
}

void take_out(Rest& rest, Index k) {
  const Index n = rest.s.rows();
  const Rest old = rest;
  const Real d = old.s(k, k);
  for (Index i = 0; i < n; ++i)
    for (Index j = 0; j < n; ++j) {
      if (i == k || j == k) continue;
      const Real product = old.s(i, k) * old.s(k, j) / d;
      rest.s(i, j) -= product;
      if (product != 0)
        rest.e(i, j) += (std::fabs(old.s(i, k)) * old.e(k, j) + std::fabs(old.s(k, j)) * old.e(i, k)) / d +
                        std::fabs(product) * old.e(k, k) / d +
                        2 * kEps * (std::fabs(product) + std::fabs(rest.s(i, j)));
    }
}

enum class Verdict { accept, drop, refuse, unclear };

Verdict judge(const Rest& rest, Index k, Real diagonal, double tolerance, Real margin) {
  const Real d = rest.s(k, k);
  const Real e = margin * rest.e(k, k);
  const Real t = std::fabs(diagonal) * tolerance;
  const Real limit = t < 0.1L ? -0.1L : -100 * t;
  if (std::fabs(diagonal) > 1e9L) return Verdict::unclear;
  if ((d - t != 0 || e > 0) && std::fabs(d - t) <= e) return Verdict::unclear;
  if (e > 0 && std::fabs(d - limit) <= e) return Verdict::unclear;
  if (d > t) return rest.e(k, k) > 1e-11L * d || d < 1e-7L ? Verdict::unclear : Verdict::accept;
  return d < limit ? Verdict::refuse : Verdict::drop;
}

}  // namespace

std::vector<Index> natural_order(Index n) {
  std::vector<Index> order(static_cast<std::size_t>(n));
  std::iota(order.begin(), order.end(), Index{0});
  return order;
}

Elimination eliminate(const Values& a, const std::vector<Index>& order, double tolerance) {
  const Index n = a.rows();
  Elimination out;
  out.u = Reals(n, n);
  out.accepted.assign(static_cast<std::size_t>(n), false);
  out.d.assign(static_cast<std::size_t>(n), 0);
  Rest rest = start(a);
  for (Index k = 0; k < n; ++k) {
    const Index row = order[static_cast<std::size_t>(k)];
    out.u(k, k) = 1;
    const Verdict verdict = judge(rest, row, a(row, row), tolerance, 8);
    if (verdict == Verdict::unclear) out.clear = false;
    if (verdict == Verdict::refuse) out.definite = false;
    if (!out.clear || !out.definite) return out;
    if (verdict == Verdict::drop) continue;
    const Real d = rest.s(row, row);
    out.accepted[static_cast<std::size_t>(k)] = true;
    out.d[static_cast<std::size_t>(k)] = d;
    out.rank += 1;
    out.log_det += std::log(d);
    for (Index j = k + 1; j < n; ++j) {
      const Index col = order[static_cast<std::size_t>(j)];
      const Real s = rest.s(row, col);
      out.u(k, j) = s / d;
      const Real relative = rest.e(row, row) / d + 4 * kEps;
      out.error = std::max(out.error, (rest.e(row, col) + std::fabs(s) * relative) * std::max(1 / d, 1 / std::sqrt(d)));
    }
    out.error = std::max(out.error, (rest.e(row, row) / d + 4 * kEps) * std::max(1 / d, std::sqrt(d)));
    take_out(rest, row);
  }
  return out;
}

bool clear_in_every_order(const Values& a) {
  const Index n = a.rows();
  std::set<unsigned> seen{0U};
  std::vector<std::pair<unsigned, Rest>> todo{{0U, start(a)}};
  while (!todo.empty()) {
    const auto [taken, rest] = todo.back();
    todo.pop_back();
    for (Index k = 0; k < n; ++k) {
      const unsigned bit = 1U << static_cast<unsigned>(k);
      if (taken & bit) continue;
      const Verdict verdict = judge(rest, k, a(k, k), kTolerance, 64);
      if (verdict == Verdict::unclear) return false;
      if (verdict != Verdict::accept || !seen.insert(taken | bit).second) continue;
      Rest next = rest;
      take_out(next, k);
      todo.emplace_back(taken | bit, next);
    }
  }
  return true;
}

bool clear_in_some_orders(const Values& a) {
  std::vector<Index> order = natural_order(a.rows());
  for (int turn = 0; turn < 4; ++turn) {
    if (!eliminate(a, order, kTolerance).clear) return false;
    std::reverse(order.begin(), order.end());
    if (turn == 1) std::partition(order.begin(), order.end(), [](Index i) { return i % 3 == 1; });
  }
  return true;
}

Values packed_factor(const Elimination& e) {
  const Index n = e.u.rows();
  Values r(n, n);
  for (Index i = 0; i < n; ++i)
    for (Index j = i; j < n && e.accepted[static_cast<std::size_t>(i)]; ++j)
      r(i, j) = static_cast<double>(std::sqrt(e.d[static_cast<std::size_t>(i)]) * e.u(i, j));
  return r;
}

Inverse inverse_of_factor(const Values& r) {
  const Index n = r.rows();
  Inverse out;
  out.g = Values(n, n);
  Reals inverse(n, n);  // of the accepted block
  for (Index j = 0; j < n; ++j) {
    if (!(r(j, j) > 0)) continue;
    out.rank += 1;
    out.log_det += 2 * std::log(static_cast<Real>(r(j, j)));
    for (Index i = j; i >= 0; --i) {
      if (!(r(i, i) > 0)) continue;
      Real s = i == j ? 1 : 0;
      for (Index k = i + 1; k <= j; ++k) s -= static_cast<Real>(r(i, k)) * inverse(k, j);
      inverse(i, j) = s / r(i, i);
    }
  }
  const auto abs_product = [n](auto&& left, auto&& right) {
    Reals p(n, n);
    for (Index i = 0; i < n; ++i)
      for (Index j = 0; j < n; ++j)
        for (Index k = 0; k < n; ++k) p(i, j) += std::fabs(left(i, k)) * std::fabs(right(k, j));
    return p;
  };
  for (Index i = 0; i < n; ++i)
    for (Index j = i; j < n; ++j) {
      Real s = 0;
      for (Index k = 0; k < n; ++k) s += inverse(i, k) * inverse(j, k);
      out.g(i, j) = static_cast<double>(s);
    }
  const auto accepted = [&](Index i, Index j) {
    return r(i, i) > 0 && r(j, j) > 0 ? static_cast<Real>(r(i, j)) : 0.0L;
  };
  const Reals g = abs_product(inverse, [&](Index i, Index j) { return inverse(j, i); });
  const Reals a = abs_product([&](Index i, Index j) { return accepted(j, i); }, accepted);
  const Reals bound = abs_product(abs_product(g, a), g);
  Real worst = 0;
  for (Index i = 0; i < n; ++i)
    for (Index j = 0; j < n; ++j) worst = std::max(worst, bound(i, j));
  out.slack = 64 * kEps * static_cast<double>(worst);
  out.clear = out.slack < 1e-6;
  return out;
}

namespace {

// Forward and backward with R, in `sign` -1; with the magnitudes and `sign` +1 the same sweep bounds the rounding.
std::vector<Real> sweep_packed(const Values& r, std::vector<Real> y, bool magnitudes) {
  const Index n = r.rows();
  const auto element = [&](Index i, Index j) -> Real { return magnitudes ? std::fabs(r(i, j)) : -r(i, j); };
  const auto at = [](Index i) { return static_cast<std::size_t>(i); };
  for (Index i = 0; i < n; ++i) {
    for (Index j = 0; j < i; ++j) y[at(i)] += element(j, i) * y[at(j)];
    if (r(i, i) > 0) y[at(i)] /= r(i, i);
  }
  for (Index i = n; i-- > 0;) {
    for (Index j = i + 1; j < n; ++j) y[at(i)] += element(i, j) * y[at(j)];
    if (r(i, i) > 0) y[at(i)] /= r(i, i);
  }
  return y;
}

std::vector<Real> sweep_sparse(const SparseFactor& f, std::vector<Real> w, bool magnitudes) {
  const Index n = f.u.rows();
  const auto element = [&](Index i, Index j) -> Real { return magnitudes ? std::fabs(f.u(i, j)) : -f.u(i, j); };
  const auto at = [](Index i) { return static_cast<std::size_t>(i); };
  for (Index k = 0; k < n; ++k) {
    for (Index c = k + 1; c < n; ++c) w[at(c)] += element(k, c) * w[at(k)];
  }
  for (Index k = 0; k < n; ++k)
    w[at(k)] *= magnitudes ? std::fabs(f.reciprocal[at(k)]) : static_cast<Real>(f.reciprocal[at(k)]);
  for (Index k = n; k-- > 0;)
    for (Index c = k + 1; c < n; ++c) w[at(k)] += element(k, c) * w[at(c)];
  return w;
}

double bound(Real magnitude) { return 64 * kEps * static_cast<double>(magnitude); }

}  // namespace

Solution solve_packed(const Values& r, const double* b) {
  const std::size_t n = static_cast<std::size_t>(r.rows());
  std::vector<Real> right(b, b + n);
  const std::vector<Real> x = sweep_packed(r, right, false);
  for (Real& value : right) value = std::fabs(value);
  const std::vector<Real> worst = sweep_packed(r, right, true);
  Solution out;
  for (std::size_t i = 0; i < n; ++i) {
    out.x.push_back(static_cast<double>(x[i]));
    out.slack.push_back(bound(worst[i]));
  }
  return out;
}

Solution solve_sparse(const SparseFactor& f, const std::vector<Index>& perm, const double* b) {
  std::vector<Real> right;
  for (const Index row : perm) right.push_back(b[row]);
  const std::vector<Real> x = sweep_sparse(f, right, false);
  for (Real& value : right) value = std::fabs(value);
  const std::vector<Real> worst = sweep_sparse(f, right, true);
  Solution out{std::vector<double>(perm.size()), std::vector<double>(perm.size())};
  for (std::size_t k = 0; k < perm.size(); ++k) {
    out.x[static_cast<std::size_t>(perm[k])] = static_cast<double>(x[k]);
    out.slack[static_cast<std::size_t>(perm[k])] = bound(worst[k]);
  }
  return out;
}

Solution inverse_diagonal(const SparseFactor& f, const std::vector<Index>& perm) {
  const Index n = f.u.rows();
  SparseFactor g = f;
  const auto kept = [&](Index k) { return f.reciprocal[static_cast<std::size_t>(k)] > 0; };
  for (Index k = 0; k < n; ++k) {
    if (kept(k)) continue;
    g.reciprocal[static_cast<std::size_t>(k)] = 0;
    for (Index j = 0; j < n; ++j)
      if (j != k) g.u(k, j) = g.u(j, k) = 0;
  }
  Solution out{std::vector<double>(perm.size()), std::vector<double>(perm.size())};
  for (Index k = 0; k < n; ++k) {
    if (!kept(k)) continue;
    const Index row = perm[static_cast<std::size_t>(k)];
    std::vector<double> unit(perm.size());
    unit[static_cast<std::size_t>(row)] = 1;
    const Solution column = solve_sparse(g, perm, unit.data());
    out.x[static_cast<std::size_t>(row)] = column.x[static_cast<std::size_t>(row)];
    out.slack[static_cast<std::size_t>(row)] = column.slack[static_cast<std::size_t>(row)];
  }
  return out;
}

}  // namespace sm::test
