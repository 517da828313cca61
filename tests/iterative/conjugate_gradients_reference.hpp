// Conjugate gradients with a diagonal preconditioner, dense and in long double, and the module's solver beside it.
#pragma once

#include <vector>

#include "ginv/ginv_support.hpp"

namespace sm::test {

// What the recurrence gives for one right-hand side, step by step.
struct Recurrence {
  std::vector<long double> rho;               // before the first step, then after each
  std::vector<std::vector<double>> iterates;  // after each step
};
Recurrence conjugate_gradients(const Dense& a, const std::vector<double>& b, std::int64_t steps);

// One call of the solver: x has room for the solutions and one number behind them, which must stay.
struct Solved {
  SmStatus status = SM_OK;
  std::vector<double> x;
  std::int64_t iterations = -55;
  double residual = kUntouched;
};
struct Limits {
  double tolerance = 1e-10;
  std::int64_t max_iterations = 0;
  std::int32_t nrhs = 1;
};
Solved solve(SmMatrix* matrix, const std::vector<double>& b, const Limits& limits = {});

// The callback's calls.
struct Step {
  double rho;
  std::int64_t user_word;
  std::int64_t iteration;
  bool operator==(const Step&) const = default;
};
struct Recorder {
  std::vector<Step> steps;
  std::int64_t stop_at = -1;  // answers non-zero at that step
  std::int32_t answer = 1;
  static std::int32_t record(void* context, double rho, std::int64_t user_word, std::int64_t iteration);
};

// Symmetric, with condition number about `condition`: it keeps conjugate gradients busy.
Dense ill_conditioned(std::int64_t n, double condition);

}  // namespace sm::test
