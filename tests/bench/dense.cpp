#include "tests/bench/dense.hpp"

#include <algorithm>
#include <cmath>
#include <limits>

namespace sm::bench::test {
namespace {

std::size_t at(int i) { return static_cast<std::size_t>(i); }

}  // namespace

Dense::Dense(const Problem& problem) : Dense(problem.n) {
  const Triplets& t = problem.upper;
  for (std::size_t k = 0; k < t.size(); ++k) {
    (*this)(t.row[k], t.col[k]) += t.value[k];
    if (t.row[k] != t.col[k]) (*this)(t.col[k], t.row[k]) += t.value[k];
  }
}

Dense operator*(const Dense& a, const Dense& b) {
  Dense c(a.order());
  for (int i = 0; i < a.order(); ++i) {
    for (int k = 0; k < a.order(); ++k) {
      for (int j = 0; j < a.order(); ++j) c(i, j) += a(i, k) * b(k, j);
    }
  }
  return c;
}

double largest_difference(const Dense& a, const Dense& b) {
  double largest = 0.0;
  for (int i = 0; i < a.order(); ++i) {
    for (int j = 0; j < a.order(); ++j) largest = std::max(largest, std::fabs(a(i, j) - b(i, j)));
  }
  return largest;
}

Elimination eliminate(Dense a, std::vector<double> b) {
  const int n = a.order();
  double scale = 0.0;
  for (int i = 0; i < n; ++i) scale = std::max(scale, a(i, i));
  std::vector<bool> done(at(n));
  Elimination result{.smallest_pivot = std::numeric_limits<double>::infinity()};
  for (;;) {
    int k = -1;
    for (int i = 0; i < n; ++i) {
      if (!done[at(i)] && (k == -1 || a(i, i) > a(k, k))) k = i;
    }
    if (k == -1 || a(k, k) <= 1e-10 * scale) break;
    done[at(k)] = true;
    ++result.rank;
    result.log_determinant += std::log(a(k, k));
    result.smallest_pivot = std::min(result.smallest_pivot, a(k, k));
    for (int i = 0; i < n; ++i) {
      if (done[at(i)] || a(i, k) == 0.0) continue;
      const double factor = a(i, k) / a(k, k);
      for (int j = 0; j < n; ++j) a(i, j) -= factor * a(k, j);
      b[at(i)] -= factor * b[at(k)];
    }
  }
  for (int i = 0; i < n; ++i) {
    if (done[at(i)]) continue;
    result.b_rest = std::max(result.b_rest, std::fabs(b[at(i)]));
    for (int j = 0; j < n; ++j) {
      if (!done[at(j)]) result.rest = std::max(result.rest, std::fabs(a(i, j)));
    }
  }
  return result;
}

Dense inverse(Dense a) {
  const int n = a.order();
  for (int k = 0; k < n; ++k) {
    const double pivot = 1.0 / a(k, k);
    a(k, k) = 1.0;
    for (int j = 0; j < n; ++j) a(k, j) *= pivot;
    for (int i = 0; i < n; ++i) {
      if (i == k || a(i, k) == 0.0) continue;
      const double factor = a(i, k);
      a(i, k) = 0.0;
      for (int j = 0; j < n; ++j) a(i, j) -= factor * a(k, j);
    }
  }
  return a;
}

}  // namespace sm::bench::test
