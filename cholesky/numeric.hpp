// What the two roads of the numeric factorization share: the arrays in the workspace, and the rule of the pivots.
#pragma once

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
  SmStatus judge(i64 k, double d, double& reciprocal);
  i64 rank() const { return rank_; }
  double log_sum() const { return log_sum_; }

 private:
  const SmMatrix& m_;
  double tolerance_;
  i64 rank_ = 0;
  double log_sum_ = 0.0;
};

// Both answer 0, or 103 with the rows before the bad pivot done.
[[nodiscard]] SmStatus factor_in_blocks(const NumericArrays& a, Pivots& pivots);
[[nodiscard]] SmStatus factor_by_rows(const NumericArrays& a, Pivots& pivots);

// factor_numeric by the plain road, which the tests hold the other one to.
[[nodiscard]] SmStatus factor_numeric_by_rows(SmMatrix& m);

}  // namespace sm
