// Dense references for the benchmark's own parts, by elimination with diagonal pivots. Not Eigen: its peer is compiled
// for the machine's widest vectors, and one program must not hold two kinds of it.
#pragma once

#include <vector>

#include "bench/generators/problem.hpp"

namespace sm::bench::test {

class Dense {
 public:
  explicit Dense(int n) : n_(n), values_(static_cast<std::size_t>(n) * static_cast<std::size_t>(n)) {}
  // Both triangles, summed entry by entry.
  explicit Dense(const Problem& problem);

  [[nodiscard]] int order() const { return n_; }
  double& operator()(int i, int j) { return values_[place(i, j)]; }
  double operator()(int i, int j) const { return values_[place(i, j)]; }

 private:
  [[nodiscard]] std::size_t place(int i, int j) const {
    return static_cast<std::size_t>(i) * static_cast<std::size_t>(n_) + static_cast<std::size_t>(j);
  }
  int n_;
  std::vector<double> values_;
};

Dense operator*(const Dense& a, const Dense& b);
double largest_difference(const Dense& a, const Dense& b);

// What is left of a semidefinite A and of b when the largest diagonal element has been eliminated until it is small.
struct Elimination {
  int rank = 0;
  double log_determinant = 0.0;  // of the accepted pivots
  double smallest_pivot = 0.0;
  double rest = 0.0;    // the largest magnitude in the Schur complement: 0 for a semidefinite matrix
  double b_rest = 0.0;  // and in what remains of b: 0 when b is in the range
};
Elimination eliminate(Dense a, std::vector<double> b);

// Of a definite matrix, by Gauss and Jordan.
Dense inverse(Dense a);

}  // namespace sm::bench::test
