// The dense arithmetic behind the model, in long double, with bounds of what double arithmetic may make of it.
#pragma once

#include <cmath>
#include <vector>

#include "model/model.hpp"

namespace sm::test {

using Real = long double;
using Reals = Table<Real>;

constexpr double kTolerance = 1.110223024625157e-12;  // settings 0 to 2
constexpr double kEps = 2.220446049250313e-16;

// A sum of products: its value, and how far the same sum in another order may be from it. Small multiples of 2^-30
// cannot round, so that their sums have no slack.
class Sum {
 public:
  void add(Real a, Real b = 1, Real c = 1) {
    value_ += a * b * c;
    magnitude_ += std::fabs(a * b * c);
    exact_ = exact_ && fits(a) && fits(b) && fits(c) && fits(a * b) && fits(b * c) && fits(a * b * c);
    ++terms_;
  }
  void widen(double slack) { extra_ += slack; }  // for a term that is not known better
  double value() const { return static_cast<double>(value_); }
  double slack() const {
    if (!std::isfinite(magnitude_) || (exact_ && extra_ == 0 && magnitude_ < 1048576.0L)) return 0;
    return extra_ + 4 * static_cast<double>(terms_ + 2) * kEps * static_cast<double>(magnitude_);
  }

 private:
  static bool fits(Real x) { return std::fabs(x) < 1048576.0L && std::ldexp(x, 30) == std::floor(std::ldexp(x, 30)); }
  Real value_ = 0;
  Real magnitude_ = 0;
  double extra_ = 0;
  bool exact_ = true;
  int terms_ = 0;
};

// A = U'DU by the rule of the pivots, in a given order of the rows. `clear` is false when a pivot is so near a limit,
// or so small, that rounding could decide otherwise or spoil what follows.
struct Elimination {
  bool clear = true;
  bool definite = true;  // false: 103, and the rest is not filled
  std::vector<bool> accepted;
  std::vector<Real> d;
  Reals u;         // unit upper triangular, in the new order; a dropped row is that of the identity
  Real error = 0;  // of the elements of U, of R = sqrt(D) U, and of the reciprocal pivots
  Index rank = 0;
  Real log_det = 0;
};
Elimination eliminate(const Values& a, const std::vector<Index>& order, double tolerance);
std::vector<Index> natural_order(Index n);
// Whether elimination is clear in every order.
bool clear_in_every_order(const Values& a);
// The same for a few orders, of a matrix that has too many.
bool clear_in_some_orders(const Values& a);

// R with R'R = A: sqrt(D) U, zero in dropped rows.
Values packed_factor(const Elimination& e);

// The generalized inverse that belongs to a packed factor: the inverse of the accepted block, zero elsewhere. It is not
// clear when its error could not be bounded usefully.
struct Inverse {
  bool clear = true;
  Values g;
  double slack = 0;
  Index rank = 0;
  Real log_det = 0;
};
Inverse inverse_of_factor(const Values& r);

// x and a bound of its error in double.
struct Solution {
  std::vector<double> x;
  std::vector<double> slack;
};
Solution solve_packed(const Values& r, const double* b);
Solution solve_sparse(const SparseFactor& f, const std::vector<Index>& perm, const double* b);
// diag of P U^-1 D^-1 U^-T P', pivots that are not positive left out.
Solution inverse_diagonal(const SparseFactor& f, const std::vector<Index>& perm);

}  // namespace sm::test
