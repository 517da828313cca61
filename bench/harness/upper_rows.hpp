// Compressed rows of the upper triangle, as our own reference of what an assembly must give; the same arrays are the
// compressed columns of the lower triangle that the peers take.
#pragma once

#include <string>
#include <vector>

#include "bench/generators/problem.hpp"

namespace sm::bench {

struct UpperRows {
  int n = 0;
  std::vector<int> start, col;  // diagonal first, columns ascending
  std::vector<double> value;

  [[nodiscard]] int entries() const { return start.back(); }
};

// Sums what falls on one place; every diagonal is there.
UpperRows compress(const Problem& problem);

// y <- A x.
std::vector<double> multiply(const UpperRows& a, const double* x);

// What is wrong with the solution of A x = b, judged by ||b - A x|| / (||A|| ||x|| + ||b||) in the infinity norm, or
// nothing.
std::string solution_fault(const UpperRows& a, const double* x, const std::vector<double>& b);

// A number against another way to it, relative to the larger of |want| and `scale`.
std::string number_fault(const char* what, double got, double want, double scale, double tolerance);

}  // namespace sm::bench
