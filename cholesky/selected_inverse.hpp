// The generalized inverse of a factored sparse matrix on the pattern of its factor.
#pragma once

#include <limits>

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
  // Where element (i, j) of the matrix's own numbering is, kNowhere when U has none. Needs a factor only.
  static i64 place(const SmMatrix& m, i64 i, i64 j);
  static constexpr i64 kNowhere = std::numeric_limits<i64>::min();
  // What is there, after compute() of the pattern.
  const double& at(i64 place) const { return place < 0 ? diag_.data()[-1 - place] : values_.data()[place]; }

 private:
  SmMatrix& m_;
  Scratch<double> values_;
  Scratch<double> diag_;
};

}  // namespace sm
