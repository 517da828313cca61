// What the two roads of the numeric factorization share: the arrays in the workspace, and the rule of the pivots.
#pragma once

#include <cmath>

#include "cholesky/steps.hpp"

namespace sm {

// The workspace of a matrix in state 4, its values from word `value_word` on. The dense work row shares storage with
// the finished reciprocal pivots: those are below the row in work, the row is at it and above.
struct NumericArrays {
  NumericArrays(const SmMatrix& matrix, i64 value_word)
      : m(matrix),
        n(m.rows),
        iju(m.work),
        iu(m.work + n),
        jl(m.work + 2 * n + 1),
        ju(m.work + 3 * n + 1),
        position(m.work + value_word),
        diag(reinterpret_cast<double*>(m.work + value_word + n)),
        values(reinterpret_cast<double*>(m.work + value_word + 2 * n)) {}

  const SmMatrix& m;
  i64 n;
  const i64 *iju, *iu;
  i64* jl;
  const i64* ju;
  i64* position;
  double* diag;
  double* values;
};

// The drop rule, and what is counted of accepted pivots.
class Pivots {
 public:
  Pivots(const SmMatrix& m, double tolerance) : m_(m), tolerance_(tolerance) {}

  // reciprocal: 1 / d, or 0 for a dropped pivot, whose row then contributes nothing. 103 below the negative limit.
  SmStatus judge(i64 k, double d, double& reciprocal) {
    const PivotLimits limits(m_.nz_values[m_.row_start[m_.perm[k]]], tolerance_);
    if (d > limits.accept) {
      reciprocal = 1.0 / d;
      count(d);
      return SM_OK;
    }
    reciprocal = 0.0;
    return d < limits.refuse ? SM_NOT_DEFINITE : SM_OK;
  }
  i64 rank() const { return rank_; }
  double log_sum() const { return log_sum_ + std::log(product_); }

 private:
  // Logarithms take as long as the rest of a small row: they are taken of products that stay in range.
  static constexpr double kSmall = 0x1p-500;
  static constexpr double kLarge = 0x1p+500;
  static bool is_moderate(double x) { return x > kSmall && x < kLarge; }
  void count(double d) {
    ++rank_;
    if (is_moderate(d)) {
      product_ *= d;
      if (is_moderate(product_)) return;
      d = product_;
      product_ = 1.0;
    }
    log_sum_ += std::log(d);
  }

  const SmMatrix& m_;
  double tolerance_;
  i64 rank_ = 0;
  double log_sum_ = 0.0;
  double product_ = 1.0;  // of pivots whose logarithm log_sum_ lacks
};

// Both answer 0, or 103: the values are then of no use.
[[nodiscard]] SmStatus factor_in_blocks(const NumericArrays& a, Pivots& pivots);
[[nodiscard]] SmStatus factor_by_rows(const NumericArrays& a, Pivots& pivots);

// factor_numeric by the plain road, which the tests hold the other one to.
[[nodiscard]] SmStatus factor_numeric_by_rows(SmMatrix& m);

}  // namespace sm
