#include <fmt/core.h>

#include <algorithm>

#include "cli/answers.hpp"
#include "cli/commands.hpp"
#include "cli/facts.hpp"
#include "cli/format.hpp"
#include "cli/gradients.hpp"
#include "cli/run.hpp"

namespace sm::cli {
namespace {

Columns right_hand_sides(Run& run, const SolveOptions& options) {
  const CompressedRows& upper = run.matrix().rows;
  if (!options.right_hand_sides.empty()) {
    return load_columns(options.right_hand_sides, upper.rows, run.common().ceiling, run.clock().progress());
  }
  const auto n = static_cast<std::size_t>(upper.rows);
  Columns b{.rows = upper.rows, .count = 1, .values = std::vector<double>(n)};
  const std::vector<double> ones(n, 1.0);
  multiply_symmetric(upper, ones.data(), b.values.data());
  return b;
}

void report_right_hand_sides(Report& report, const SolveOptions& options, std::int64_t count) {
  const std::string& file = options.right_hand_sides;
  report.add("right_hand_side_file", file.empty() ? Json() : Json(file), "right-hand sides",
             file.empty() ? "1, b = A * 1" : fmt::format("{}, from {}", count, file));
}

// Each answers false when there is no solution to speak of; the report then says why.
bool solve_direct(Run& run, const std::string& blamed, const Columns& b, std::vector<double>& x) {
  Factorization* const factor = run.factored();
  if (!factor) return false;
  factor->solve(b.values.data(), x.data(), b.count);
  run.report().add("method", "direct", "method", "direct, by factorization");
  report_outcome(run.report(), *factor);
  const bool singular = factor->rank() < factor->order();
  std::vector<Answer> answers = measure(run.matrix().rows, b, x);
  for (Answer& answer : answers) answer.consistent = !singular || answer.residual <= kInconsistent;
  report_answers(run.report(), blamed, answers, singular);
  return true;
}

bool solve_iterative(Run& run, const SolveOptions& options, const std::string& blamed, const Columns& b,
                     std::vector<double>& x) {
  const GradientLimits limits{.tolerance = options.tolerance.value_or(kConverged),
                              .max_iterations = options.max_iterations.value_or(b.rows + 2)};
  auto outcomes = solve_by_gradients(run, b, limits, run.common().json, x);
  if (run.report().code() != ExitCode::fine) return false;
  Report& report = run.report();
  report.add("method", "cg", "method", "conjugate gradients, preconditioned by the diagonal");
  report.add("tolerance", limits.tolerance, "tolerance", number_text(limits.tolerance));
  report.add("max_iterations", limits.max_iterations, "max iterations", fmt::format("{}", limits.max_iterations));
  std::int64_t most = 0;
  std::vector<Answer> answers = measure(run.matrix().rows, b, x);
  for (std::size_t j = 0; j < answers.size(); ++j) {
    most = std::max(most, outcomes[j].iterations);
    answers[j].consistent = !outcomes[j].empty_row;
    answers[j].gradients = std::move(outcomes[j]);
  }
  report.add("iterations", most, "iterations", fmt::format("{} (the most for one right-hand side)", most));
  report_answers(report, blamed, answers, false);
  return true;
}

}  // namespace

Report run_solve(const SolveOptions& options, const CommonOptions& common, Progress& progress) {
  Run run("solve", {options.matrix, options.right_hand_sides}, common, progress);
  require_symmetric(run.matrix());
  const Columns b = right_hand_sides(run, options);
  const auto output = run.open_output();
  const std::string& name = run.matrix().name;
  const std::string& blamed = options.right_hand_sides.empty() ? name : options.right_hand_sides;
  report_right_hand_sides(run.report(), options, b.count);
  std::vector<double> x(b.values.size());
  const bool solved =
      options.method == "cg" ? solve_iterative(run, options, blamed, b, x) : solve_direct(run, blamed, b, x);
  if (!solved) return run.finish();
  if (output) write_array(*output, b.rows, b.count, x.data(), comment_text("solution of A x = b, A in " + name));
  report_written(run.report(), output.get(), "solution", fmt::format("{} x {}", b.rows, b.count));
  return run.finish();
}

}  // namespace sm::cli
