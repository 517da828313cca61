#include <fmt/core.h>

#include <bit>
#include <cmath>
#include <numeric>
#include <optional>

#include "cli/commands.hpp"
#include "cli/facts.hpp"
#include "cli/format.hpp"
#include "cli/module_matrix.hpp"
#include "cli/run.hpp"

namespace sm::cli {
namespace {

using Other = std::optional<LoadedMatrix>;

// A product has a trace when it is square.
void require_square_product(const LoadedMatrix& matrix, const Other& other) {
  const Header& a = matrix.header;
  const Header& b = other ? other->header : a;
  if (other ? a.cols == b.rows && a.rows == b.cols : a.rows == a.cols) return;
  throw CommandError({.file = other ? other->name : matrix.name,
                      .line = b.size_line,
                      .what = fmt::format("found {} rows and {} columns", b.rows, b.cols),
                      .expected = other ? fmt::format("{} rows and {} columns", a.cols, a.rows) : "a square matrix",
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

double plain_trace(Run& run, const Other& other) {
  const LoadedMatrix& a = run.matrix();
  if (a.rows.size() == 0 || (other && other->rows.size() == 0)) return 0.0;
  ModuleSession& session = run.session();
  SmMatrix* first = sparse_matrix(session, a, run.clock());
  SmMatrix* second = other ? sparse_matrix(session, *other, run.clock()) : nullptr;
  // A general matrix is not served with a symmetric one behind it, but tr(A B) = tr(B A).
  if (other && !a.upper_only && other->upper_only) std::swap(first, second);
  double trace = 0.0;
  const SmStatus status = run.clock().timed("tracing", [&] {
    return second ? session.fn().qxsmtraceAB(first, second, &trace) : session.fn().qxsmtrace(first, &trace);
  });
  return checked(session, status, trace);
}

double inverse_trace(Run& run, Factorization& factorization, const Other& other) {
  if (!other) {
    const std::vector<double> diagonal = factorization.inverse_diagonal();
    return std::accumulate(diagonal.begin(), diagonal.end(), 0.0);
  }
  if (other->rows.size() == 0) return 0.0;
  SmMatrix* const b = sparse_matrix(run.session(), *other, run.clock());
  double trace = 0.0;
  const SmStatus status = run.clock().timed(
      "tracing", [&] { return run.session().steps().qxsmtraceinvAB(factorization.matrix(), b, 0, &trace); });
  return checked(run.session(), status, trace);
}

void report_trace(Run& run, double trace, const std::string& of) {
  const bool finite = std::isfinite(trace);
  run.report().add_json("of", of);
  run.report().add("trace", finite ? Json(trace) : Json(), fmt::format("tr({})", of),
                   finite ? number_text(trace) : "not finite");
  if (finite) return;
  run.report().fail(
      {.code = ExitCode::no, .file = run.matrix().name, .what = "the trace overflows", .advice = "scale the matrices"});
}

}  // namespace

Report run_trace(const TraceOptions& options, const CommonOptions& common, Progress& progress) {
  Run run("trace", {options.matrix, options.other}, common, progress);
  Other b;
  if (!options.other.empty()) b = run.load(options.other);
  if (options.inverse) require_symmetric(run.matrix());
  require_square_product(run.matrix(), b);
  run.report().add("other_file", b ? Json(b->name) : Json(), "second matrix", b ? matrix_text(*b) : "none");
  const std::string of = std::string(options.inverse ? "A^-" : "A") + (b ? " B" : "");
  if (!options.inverse) {
    report_trace(run, plain_trace(run, b), of);
  } else if (Factorization* const factor = run.factored()) {
    const double trace = inverse_trace(run, *factor, b);
    report_outcome(run.report(), *factor);
    report_trace(run, trace, of);
  }
  return run.finish();
}

}  // namespace sm::cli
