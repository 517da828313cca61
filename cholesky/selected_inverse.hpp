// The generalized inverse of a factored sparse matrix on the pattern of its factor.
#pragma once

#include "frame/memory.hpp"

namespace sm {

class SelectedInverse {
 public:
  enum class Wanted { diagonal, pattern };

  explicit SelectedInverse(SmMatrix& m) : m_(m) {}

  // Of a symmetric sparse matrix in state 5, in memory from its pool; 101. Uses the record's factor_scratch.
  [[nodiscard]] SmStatus compute(Wanted wanted = Wanted::pattern);
  // In the order of the factor.
  double diagonal(i64 k) const { return diag_.data()[k]; }
  // Element (i, j) of the matrix's own numbering, null where U has none. Needs compute() of the pattern.
  const double* find(i64 i, i64 j) const;
  // Whether U has element (i, j).
  static bool is_on_pattern(const SmMatrix& m, i64 i, i64 j) { return place(m, i, j) >= -1; }

 private:
  // Where (i, j) is in the values of U; -1 for the diagonal, -2 for none.
  static i64 place(const SmMatrix& m, i64 i, i64 j);

  SmMatrix& m_;
  Scratch<double> values_;
  Scratch<double> diag_;
};

}  // namespace sm
