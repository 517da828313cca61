#include "cli/facts.hpp"

#include <fmt/core.h>

#include <algorithm>

#include "cli/format.hpp"
#include "cli/structure.hpp"

namespace sm::cli {
namespace {

constexpr std::size_t kShown = 10;  // values listed in the text

}  // namespace

std::uint64_t pool_ceiling(const CommonOptions& common) {
  if (!common.memory.empty()) return common.ceiling;
  // A sixteenth is left to the vectors of the solution and to everything else that runs here.
  const std::uint64_t usable = common.ceiling - common.ceiling / 16;
  return usable - std::min(peak_resident(), usable - 1);
}

void report_matrix(Report& report, const LoadedMatrix& matrix) {
  const Header& header = matrix.header;
  report.add("file", matrix.name, "matrix", fmt::format("{} ({})", matrix.name, kind_text(header)));
  report.add_json("format", kind_text(header));
  report.add("rows", header.rows, "order", fmt::format("{} x {}", header.rows, header.cols));
  report.add_json("cols", header.cols);
  const std::int64_t merged = matrix.file_entries - matrix.rows.size();
  std::string text = fmt::format("{}", matrix.file_entries);
  if (merged > 0) text += fmt::format(" in the file, {} after adding up those at one position", matrix.rows.size());
  report.add("stored_entries", matrix.file_entries, "stored entries", text);
}

void report_ordering(Report& report, Ordering ordering) {
  report.add("ordering", ordering_name(ordering), "ordered by", ordering_text(ordering));
}

void report_outcome(Report& report, const Factorization& factorization) {
  const std::int64_t n = factorization.order();
  const bool definite = factorization.rank() == n;
  const auto dropped = factorization.dropped_rows();
  report.add("rank", factorization.rank(), "rank", fmt::format("{} of {}", factorization.rank(), n));
  report.add("log_determinant", factorization.log_determinant(), "log-determinant",
             number_text(factorization.log_determinant()) + (definite ? "" : " (of the accepted pivots)"));
  const std::string definiteness = definite ? "positive definite" : "positive semidefinite, singular";
  report.add("definiteness", definiteness, "definiteness", definiteness);
  report.add("rows_dropped", dropped, "rows dropped", list_text(dropped));
}

void report_counts(Report& report, const FactorCounts& counts, std::int64_t order) {
  report.add("upper_entries", counts.entries, "upper triangle",
             fmt::format("{} entries with the diagonal", counts.entries));
  report.add("nnz_u", counts.nnz_u, "nnz(U)", fmt::format("{} off the diagonal", counts.nnz_u));
  report.add("fill_ratio", counts.fill_ratio(order), "fill ratio",
             fmt::format("{:.3f} (U with its diagonal / upper triangle)", counts.fill_ratio(order)));
  report.add("subscripts_stored", counts.subscripts, "subscripts", fmt::format("{} stored", counts.subscripts));
  report.add("flops", counts.flops, "flops",
             fmt::format("{:.0f} (sum of L(L+2) over the rows of U, L entries off the diagonal)", counts.flops));
}

void report_phases(Report& report, const PhaseClock& clock) {
  Json phases = Json::array();
  const auto add = [&](const Phase& phase) {
    Json json{{"name", phase.name}, {"seconds", phase.seconds}};
    if (phase.flops > 0.0) json["gflops"] = phase.gflops();
    phases.push_back(std::move(json));
    report.add_text(phase.name, fmt::format("{} s{}", seconds_text(phase.seconds),
                                            phase.flops > 0.0 ? fmt::format(", {:.3f} GFLOP/s", phase.gflops()) : ""));
  };
  for (const Phase& phase : clock.phases()) add(phase);
  report.add_json("phases", std::move(phases));
}

void report_memory(Report& report, const ModuleSession& session) {
  const std::uint64_t pools = session.peak_bytes();
  const std::uint64_t resident = peak_resident();
  report.add("peak_pool_bytes", pools, "peak memory",
             fmt::format("{} in pools, {} resident", bytes_text(static_cast<double>(pools)),
                         bytes_text(static_cast<double>(resident))));
  report.add_json("peak_resident_bytes", resident);
}

void report_first_values(Report& report, const char* label, std::span<const double> values) {
  const std::size_t shown = std::min(kShown, values.size());
  for (std::size_t i = 0; i < shown; ++i) report.add_text(fmt::format("{} {}", label, i + 1), number_text(values[i]));
  if (values.size() > shown) report.add_text("...", fmt::format("{} more", values.size() - shown));
  report.add_json("first_values",
                  std::vector<double>(values.begin(), values.begin() + static_cast<std::ptrdiff_t>(shown)));
}

void report_written(Report& report, const OutputFile* output, const char* label, const std::string& shape) {
  report.add("output", output ? Json(output->path()) : Json(), label,
             output ? fmt::format("{}, in {}", shape, output->path()) : "to no file (see -o)");
}

std::string matrix_text(const LoadedMatrix& matrix) {
  const Header& header = matrix.header;
  return fmt::format("{} ({}), {} x {}", matrix.name, kind_text(header), header.rows, header.cols);
}

void report_not_definite(Report& report, const LoadedMatrix& matrix) {
  report.add("definiteness", "not positive semidefinite", "definiteness", "not positive semidefinite");
  const Diagonal diagonal = inspect_diagonal(matrix.rows);
  const bool negative = diagonal.present > 0 && diagonal.smallest < 0.0;
  report.fail({.code = ExitCode::no,
               .file = matrix.name,
               .what = "not positive semidefinite (a pivot is negative)",
               .advice = negative
                             ? fmt::format("the diagonal goes down to {}: check the signs, or add a multiple of the "
                                           "identity",
                                           number_text(diagonal.smallest))
                             : "check the entries off the diagonal, or add a multiple of the identity"});
}

}  // namespace sm::cli
