#include <fmt/format.h>

#include <algorithm>
#include <cmath>
#include <optional>

#include "cli/commands.hpp"
#include "cli/facts.hpp"
#include "cli/format.hpp"
#include "cli/output_file.hpp"

namespace sm::cli {
namespace {

constexpr std::size_t kShown = 10;  // elements listed when they go to no file

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

void report_values(Report& report, std::optional<OutputFile>& output, const std::vector<double>& diagonal,
                   const std::string& name) {
  const auto n = static_cast<std::int64_t>(diagonal.size());
  if (output) write_array(*output, n, 1, diagonal.data(), comment_text("diagonal of the inverse of " + name));
  const std::size_t shown = std::min(kShown, diagonal.size());
  if (!output) {
    for (std::size_t i = 0; i < shown; ++i) {
      report.add_text(fmt::format("row {}", i + 1), number_text(diagonal[i]));
    }
    if (diagonal.size() > shown) report.add_text("...", fmt::format("{} more", diagonal.size() - shown));
  }
  report.add_json("first_values",
                  std::vector<double>(diagonal.begin(), diagonal.begin() + static_cast<std::ptrdiff_t>(shown)));
  report.add("output", output ? Json(output->path()) : Json(), "written",
             output ? fmt::format("{} x 1, in {}", n, output->path()) : "to no file (see -o)");
}

}  // namespace

Report run_invdiag(const InvdiagOptions& options, const CommonOptions& common, Progress& progress) {
  LoadedMatrix matrix = load_matrix(options.matrix, common.ceiling, progress);
  Report report("invdiag");
  report_matrix(report, matrix);
  require_symmetric(matrix);
  std::optional<OutputFile> output;
  if (!options.output.empty()) output.emplace(options.output, std::vector{options.matrix});

  ModuleSession session(pool_ceiling(common));
  Factorization factorization(session, matrix.rows, progress);
  factorization.analyse();
  if (!factorization.factor()) {
    report_not_definite(report, matrix);
    return report;
  }
  const std::vector<double> diagonal = factorization.inverse_diagonal();
  report_outcome(report, factorization);
  report_range(report, matrix.name, diagonal);
  report_values(report, output, diagonal, matrix.name);
  report_phases(report, matrix.seconds, factorization);
  report_memory(report, session);
  return report;
}

}  // namespace sm::cli
