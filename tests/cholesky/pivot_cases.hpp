// Matrices whose last pivot is a chosen number to the bit.
#pragma once

#include <cmath>
#include <vector>

#include "support/random_matrices.hpp"

namespace sm::test {

// Four integers whose squares add up to n (Lagrange: they exist).
inline std::vector<std::int64_t> four_squares(std::int64_t n) {
  const auto root = [](std::int64_t v) {
    auto r = static_cast<std::int64_t>(std::sqrt(static_cast<double>(v)));
    while (r * r > v) --r;
    while ((r + 1) * (r + 1) <= v) ++r;
    return r;
  };
  for (std::int64_t a = root(n); a >= 0; --a)
    for (std::int64_t b = root(n - a * a), tries = 0; b >= 0 && tries < 64; --b, ++tries) {
      const std::int64_t rest = n - a * a - b * b;
      for (std::int64_t c = root(rest); 2 * c * c >= rest; --c) {
        const std::int64_t d = root(rest - c * c);
        if (d * d == rest - c * c) return {a, b, c, d};
        if (c == 0) break;
      }
    }
  return {};
}

// Order 5: four pivots of 1, and the last diagonal `a`. In natural order the last pivot is a - subtracted * unit^2, and
// every operation on the way to it is exact when the squares are integers below 2^53 and `a` a multiple of unit^2 of
// that size too.
inline Problem bordered(double a, std::int64_t subtracted, double unit) {
  Problem p{"bordered", 5, {}};
  const std::vector<std::int64_t> s = four_squares(subtracted);
  for (std::int64_t i = 0; i < 4; ++i) {
    p.upper.push_back({i, i, 1.0});
    p.upper.push_back({i, 4, static_cast<double>(s[static_cast<std::size_t>(i)]) * unit});
  }
  p.upper.push_back({4, 4, a});
  return p;
}

// Diagonals a in [1, 2) for which a * tolerance rounds to a multiple x of 2^-52, so that a pivot can be exactly
// a * tolerance: bordered(a, steps, 2^-26) has it.
struct ExactThreshold {
  double a;
  std::int64_t steps;  // (a - x) in units of 2^-52
};
inline std::vector<ExactThreshold> exact_thresholds(double tolerance, std::size_t count) {
  std::vector<ExactThreshold> cases;
  for (std::int64_t k = 1; k < (std::int64_t{1} << 20) && cases.size() < count; ++k) {
    const double x = std::ldexp(static_cast<double>(k), -52);
    const double a = x / tolerance;
    if (a < 1.0 || a >= 2.0 || a * tolerance != x) continue;
    cases.push_back({a, static_cast<std::int64_t>(std::ldexp(a - x, 52))});
  }
  return cases;
}

}  // namespace sm::test
