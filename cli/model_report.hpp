// What the command itself says of a model, beside the summary of a fit.
#pragma once

#include <string>
#include <vector>

#include "cli/report.hpp"
#include "mixed/fit.hpp"
#include "mixed/model.hpp"

namespace sm::cli {

// The size of a fit that is not to be made; `bytes` is what it would take, the program and the model included.
void report_plan(Report& report, const mixed::Model& model, const mixed::EquationFacts& facts, double bytes);

// The predicted effects of every level, up to so many lines a term.
std::string effects_text(const mixed::Fit& fit, std::size_t most = 60);

// "  3  criterion 1743.628272  score 1.2e-03  step 4.5e-02"
std::string iteration_line(std::size_t number, const mixed::Iteration& iteration);

}  // namespace sm::cli
