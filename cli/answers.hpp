// How good the solutions are, and what is wrong with them.
#pragma once

#include <optional>
#include <string>
#include <vector>

#include "cli/gradients.hpp"
#include "cli/loading.hpp"
#include "cli/report.hpp"

namespace sm::cli {

// The solution for one right-hand side.
struct Answer {
  double residual = 0.0;  // ||b - A x|| / (||A|| ||x|| + ||b||) in the infinity norm, from the entries that were read
  bool consistent = true;
  std::optional<GradientOutcome> gradients;  // when they were used
};

// Residuals for a symmetric matrix, given by its upper triangle.
std::vector<Answer> measure(const CompressedRows& upper, const Columns& b, const std::vector<double>& x);

// What was found for each right-hand side, then for all of them. `name` is the file to blame; `singular` whether A is
// known to be.
void report_answers(Report& report, const std::string& name, const std::vector<Answer>& answers, bool singular);

}  // namespace sm::cli
