// Eigen's sparse LDL', half-storage product and conjugate gradients.
#pragma once

#include <memory>
#include <vector>

#include "bench/harness/steps.hpp"
#include "bench/harness/upper_rows.hpp"

namespace sm::bench {

// Ordering (AMD), factorization and one solve. False when it failed.
bool solve_by_eigen(const UpperRows& rows, const std::vector<double>& b, std::vector<double>& x);
// The same with its steps timed, for their shares: Eigen permutes the matrix once more when they are asked for one by
// one.
bool solve_by_eigen(const UpperRows& rows, const std::vector<double>& b, std::vector<double>& x, Steps& steps);

// y <- A x for k vectors, from one stored triangle.
void multiply_by_eigen(const UpperRows& rows, const std::vector<double>& x, std::vector<double>& y, int k);

// `steps` iterations with the diagonal as preconditioner, from 0, on one stored triangle; the seconds of these alone.
double iterate_by_eigen(const UpperRows& rows, const std::vector<double>& b, std::vector<double>& x, int steps);

// All contributions at once, summed into compressed columns.
class EigenAssembly {
 public:
  explicit EigenAssembly(const Problem& problem, const Triplets& entries);
  ~EigenAssembly();
  void run();
  [[nodiscard]] std::string fault(const UpperRows& want) const;

 private:
  struct State;
  std::unique_ptr<State> state_;
};

}  // namespace sm::bench
