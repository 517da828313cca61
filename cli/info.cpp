#include <fmt/core.h>

#include <utility>

#include "cli/commands.hpp"
#include "cli/facts.hpp"
#include "cli/format.hpp"
#include "cli/run.hpp"
#include "cli/structure.hpp"

namespace sm::cli {
namespace {

// Entries of the whole matrix, both triangles of a symmetric one.
std::int64_t full_entries(const LoadedMatrix& matrix, const Diagonal& diagonal) {
  return matrix.upper_only ? 2 * matrix.rows.size() - diagonal.present : matrix.rows.size();
}

void report_density(Report& report, const LoadedMatrix& matrix, const Diagonal& diagonal) {
  const double positions = static_cast<double>(matrix.header.rows) * static_cast<double>(matrix.header.cols);
  const auto entries = full_entries(matrix, diagonal);
  const double density = positions > 0.0 ? static_cast<double>(entries) / positions : 0.0;
  report.add("entries", entries, "density",
             fmt::format("{:.4g} % ({} entries in the whole matrix)", 100.0 * density, entries));
  report.add_json("density", density);
}

// Answers whether the matrix is symmetric in value.
bool report_symmetry(Report& report, const LoadedMatrix& matrix) {
  SymmetryCheck check;
  std::string text = "symmetric, as the file says";
  if (matrix.header.rows != matrix.header.cols) {
    check.pattern = check.values = false;
    text = "not square";
  } else if (!matrix.upper_only) {
    check = check_symmetry(matrix.rows);
    text = check.values    ? check.pattern ? "symmetric in pattern and value" : "symmetric in value, not in pattern"
           : check.pattern ? "symmetric in pattern, not in value"
                           : "not symmetric";
    if (!check.values) {
      text += fmt::format(" ({} at ({}, {}), {} at ({}, {}))", check.below, check.row + 1, check.col + 1, check.above,
                          check.col + 1, check.row + 1);
    }
  }
  report.add("symmetric_pattern", check.pattern, "symmetry", text);
  report.add_json("symmetric_values", check.values);
  return check.values;
}

void report_diagonal(Report& report, const Diagonal& diagonal) {
  const bool any = diagonal.present > 0;
  report.add("diagonal_smallest", any ? Json(diagonal.smallest) : Json(), "diagonal",
             any ? fmt::format("{} to {}", diagonal.smallest, diagonal.largest) : "no entries");
  report.add_json("diagonal_largest", any ? Json(diagonal.largest) : Json());
  std::string text = list_text(diagonal.missing);
  if (!diagonal.missing.empty()) text = fmt::format("{}: {}", diagonal.missing.size(), text);
  report.add("rows_without_diagonal", diagonal.missing, "without diagonal", text);
}

void report_blocks(Report& report, const LoadedMatrix& matrix, std::uint64_t limit) {
  const Blocks blocks = find_blocks(matrix.rows, limit);
  const char* unit = matrix.header.rows == matrix.header.cols ? "rows" : "rows and columns";
  report.add("blocks", blocks.count, "blocks",
             fmt::format("{}, the largest of {} {}", blocks.count, blocks.largest, unit));
  report.add_json("largest_block", blocks.largest);
}

void report_need(Report& report, std::int64_t order, std::int64_t upper) {
  const MemoryNeed need = estimate_memory(order, upper);
  report.add("assembling_bytes", need.assembling, "memory needed",
             fmt::format("{} to assemble, {} to order (estimated from order and entries; pools only)",
                         bytes_text(need.assembling), bytes_text(need.ordering)));
  report.add_json("ordering_bytes", need.ordering);
}

// Orders the matrix and finds the structure of its factor. The numeric factorization takes no further memory, so the
// peak so far is the peak of factoring.
void report_fill(Run& run) {
  const Factorization& factorization = run.analysed();
  report_counts(run.report(), factorization.counts(), factorization.order());
  const std::uint64_t bytes = run.session().peak_bytes();
  run.report().add("factoring_bytes", bytes, "to factor",
                   bytes_text(static_cast<double>(bytes)) + " (measured in pools)");
}

}  // namespace

Report run_info(const InfoOptions& options, const CommonOptions& common, Progress& progress) {
  Run run("info", {options.matrix}, common, progress);
  LoadedMatrix& matrix = run.matrix();
  Report& report = run.report();
  const Diagonal diagonal = inspect_diagonal(matrix.rows);
  report_density(report, matrix, diagonal);
  const bool symmetric = report_symmetry(report, matrix);
  report_diagonal(report, diagonal);
  report_blocks(report, matrix, common.ceiling);
  if (options.fill || symmetric) {
    require_symmetric(matrix);
    report_need(report, matrix.header.rows, matrix.rows.size() + static_cast<std::int64_t>(diagonal.missing.size()));
  } else {
    report.add("assembling_bytes", Json(), "memory needed", "none, as only symmetric matrices are factored");
    report.add_json("ordering_bytes", Json());
  }
  if (options.fill) report_fill(run);
  return std::move(report);
}

}  // namespace sm::cli
