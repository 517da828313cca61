// The inverse on the pattern of the factor, one column at a time: K. Takahashi, J. Fagan, M.-S. Chin, "Formation of a
// sparse bus impedance matrix and its application to short circuit study", 8th PICA Conference, 1973.
#pragma once

#include <vector>

#include "bench/peers/cholmod.hpp"

namespace sm::bench {

class Takahashi {
 public:
  // From a simplicial L D L', whose columns are sorted.
  explicit Takahashi(const Cholmod& factored);

  // Multiplications that run() needs.
  [[nodiscard]] double work() const;
  void run();
  // After run(), in the numbering of the matrix.
  [[nodiscard]] std::vector<double> diagonal() const;
  // At the entries of `rows`, whose pattern is within the factor's.
  [[nodiscard]] std::vector<double> on_pattern(const UpperRows& rows) const;
  // The trace of the inverse times B, whose pattern is within the factor's.
  [[nodiscard]] double trace_with(const UpperRows& b) const;

 private:
  void column(int j);
  [[nodiscard]] double element(int i, int j) const;

  int n_;
  std::vector<int> start_, row_;  // of L, diagonal first in its column
  std::vector<double> l_, z_;     // z on the same pattern
  std::vector<double> work_;      // by row: the entry of the current column of L, else 0
  std::vector<double> sum_;       // by row
  std::vector<int> place_;        // of a row of the matrix in the factor
};

}  // namespace sm::bench
