#include <fmt/format.h>

#include <bit>
#include <cmath>
#include <numeric>
#include <optional>

#include "cli/commands.hpp"
#include "cli/facts.hpp"
#include "cli/format.hpp"
#include "cli/module_matrix.hpp"

namespace sm::cli {
namespace {

struct Operands {
  LoadedMatrix a;
  std::optional<LoadedMatrix> b;
};

// A product has a trace when it is square.
void require_square_product(const Operands& operands) {
  const Header& a = operands.a.header;
  const bool alone = !operands.b;
  const Header& b = alone ? a : operands.b->header;
  if (alone ? a.rows == a.cols : a.cols == b.rows && a.rows == b.cols) return;
  throw CommandError({.file = alone ? operands.a.name : operands.b->name,
                      .line = b.size_line,
                      .what = fmt::format("found {} rows and {} columns", b.rows, b.cols),
                      .expected = alone ? "a square matrix" : fmt::format("{} rows and {} columns", a.cols, a.rows),
                      .advice = "only square matrices and products have a trace"});
}

// A sum over no entries is reported as such by the module; it is 0.
double checked(const ModuleSession& session, SmStatus status, double trace) {
  if (status == SM_NOTHING_TO_REPORT) return 0.0;
  session.expect_ok(status, "computing the trace");
  // The module's way to say that it had no memory to work in.
  if (std::bit_cast<std::uint64_t>(trace) == SM_MISSING_BITS) session.expect_ok(SM_NO_MEMORY, "computing the trace");
  return trace;
}

double plain_trace(ModuleSession& session, const Operands& operands, Progress& progress) {
  const LoadedMatrix& a = operands.a;
  if (a.rows.size() == 0 || (operands.b && operands.b->rows.size() == 0)) return 0.0;
  SmMatrix* first = module_matrix(session, a.rows, a.upper_only(), progress);
  double trace = 0.0;
  if (!operands.b) {
    const SmStatus status = session.fn().qxsmtrace(first, &trace);
    return checked(session, status, trace);
  }
  const LoadedMatrix& b = *operands.b;
  SmMatrix* second = module_matrix(session, b.rows, b.upper_only(), progress);
  progress.phase("multiplying");
  // A general matrix is not served with a symmetric one behind it, but tr(A B) = tr(B A).
  if (!a.upper_only() && b.upper_only()) std::swap(first, second);
  const SmStatus status = session.fn().qxsmtraceAB(first, second, &trace);
  return checked(session, status, trace);
}

double inverse_trace(ModuleSession& session, Factorization& factorization, const Operands& operands,
                     Progress& progress) {
  if (!operands.b) {
    const std::vector<double> diagonal = factorization.inverse_diagonal();
    return std::accumulate(diagonal.begin(), diagonal.end(), 0.0);
  }
  const LoadedMatrix& b = *operands.b;
  if (b.rows.size() == 0) return 0.0;
  double trace = 0.0;
  const SmStatus status = factorization.inverse_trace(module_matrix(session, b.rows, b.upper_only(), progress), trace);
  return checked(session, status, trace);
}

void report_trace(Report& report, double trace, const Operands& operands, bool inverse) {
  const std::string of = std::string(inverse ? "A^-" : "A") + (operands.b ? " B" : "");
  const bool finite = std::isfinite(trace);
  report.add_json("of", of);
  report.add("trace", finite ? Json(trace) : Json(), fmt::format("tr({})", of),
             finite ? number_text(trace) : "not finite");
  if (finite) return;
  report.fail(
      {.code = ExitCode::no, .file = operands.a.name, .what = "the trace overflows", .advice = "scale the matrices"});
}

Operands load_operands(const TraceOptions& options, const CommonOptions& common, Progress& progress) {
  if (options.matrix == "-" && options.other == "-") {
    throw CommandError(
        {.what = "both matrices are to come from standard input", .advice = "give one of them as a file"});
  }
  Operands operands{.a = load_matrix(options.matrix, common.ceiling, progress), .b = {}};
  if (!options.other.empty()) operands.b = load_matrix(options.other, common.ceiling, progress);
  return operands;
}

}  // namespace

Report run_trace(const TraceOptions& options, const CommonOptions& common, Progress& progress) {
  Operands operands = load_operands(options, common, progress);
  Report report("trace");
  report_matrix(report, operands.a);
  const std::optional<LoadedMatrix>& b = operands.b;
  if (options.inverse) require_symmetric(operands.a);
  require_square_product(operands);
  report.add(
      "other_file", b ? Json(b->name) : Json(), "second matrix",
      b ? fmt::format("{} ({}), {} x {}", b->name, kind_text(b->header), b->header.rows, b->header.cols) : "none");

  ModuleSession session(pool_ceiling(common));
  if (!options.inverse) {
    report_trace(report, plain_trace(session, operands, progress), operands, false);
  } else {
    Factorization factorization(session, operands.a.rows, progress);
    factorization.analyse();
    if (!factorization.factor()) {
      report_not_definite(report, operands.a);
      return report;
    }
    const double trace = inverse_trace(session, factorization, operands, progress);
    report_outcome(report, factorization);
    report_trace(report, trace, operands, true);
    report_phases(report, operands.a.seconds, factorization);
  }
  report_memory(report, session);
  return report;
}

}  // namespace sm::cli
