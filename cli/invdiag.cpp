#include <fmt/core.h>

#include <algorithm>
#include <cmath>

#include "cli/commands.hpp"
#include "cli/facts.hpp"
#include "cli/run.hpp"

namespace sm::cli {
namespace {

void report_range(Report& report, const std::string& name, const std::vector<double>& diagonal) {
  const bool finite = std::all_of(diagonal.begin(), diagonal.end(), [](double d) { return std::isfinite(d); });
  if (diagonal.empty() || !finite) {
    report.add("smallest", Json(), "diagonal", diagonal.empty() ? "no elements" : "not finite");
    report.add_json("largest", Json());
  } else {
    const auto [smallest, largest] = std::minmax_element(diagonal.begin(), diagonal.end());
    const auto row_of = [&](auto element) { return element - diagonal.begin() + 1; };
    report.add("smallest", *smallest, "smallest", fmt::format("{:.6g} in row {}", *smallest, row_of(smallest)));
    report.add_json("smallest_row", row_of(smallest));
    report.add("largest", *largest, "largest", fmt::format("{:.6g} in row {}", *largest, row_of(largest)));
    report.add_json("largest_row", row_of(largest));
  }
  if (finite) return;
  report.fail({.code = ExitCode::no,
               .file = name,
               .what = "the diagonal of the inverse overflows",
               .advice = "scale the matrix"});
}

}  // namespace

Report run_invdiag(const InvdiagOptions& options, const CommonOptions& common, Progress& progress) {
  Run run("invdiag", {options.matrix}, common, progress);
  require_symmetric(run.matrix());
  const auto output = run.open_output();
  Factorization* const factor = run.factored();
  if (!factor) return run.finish();
  const std::vector<double> diagonal = factor->inverse_diagonal();
  const std::string& name = run.matrix().name;
  report_outcome(run.report(), *factor);
  report_range(run.report(), name, diagonal);
  report_first_values(run.report(), "row", diagonal);
  const auto n = static_cast<std::int64_t>(diagonal.size());
  if (output) write_array(*output, n, 1, diagonal.data(), comment_text("diagonal of the inverse of " + name));
  report_written(run.report(), output.get(), "written", fmt::format("{} x 1", n));
  return run.finish();
}

}  // namespace sm::cli
