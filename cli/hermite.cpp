#include "cli/hermite.hpp"

#include <fmt/core.h>

#include <cmath>

#include "cli/commands.hpp"
#include "cli/facts.hpp"
#include "cli/format.hpp"
#include "cli/matrix_output.hpp"

namespace sm::cli {
namespace {

double trace_of(ModuleSession& session, SmMatrix* h) {
  double trace = 0.0;
  if (h->nnz > 0) session.expect_ok(session.fn().qxsmtrace(h, &trace), "computing the trace");
  return trace;
}

// H is a projection, so its trace is its rank, which is that of A.
void report_trace(Run& run, double trace, std::int64_t rank) {
  const bool finite = std::isfinite(trace);
  run.report().add("trace", finite ? Json(trace) : Json(), "tr(H)", finite ? number_text(trace) : "not finite");
  if (std::fabs(trace - static_cast<double>(rank)) < 0.5) return;
  run.report().fail({.code = ExitCode::no,
                     .file = run.matrix().name,
                     .what = fmt::format("the Hermite form has the trace {}", number_text(trace)),
                     .expected = fmt::format("{}, the rank", rank),
                     .advice = "scale the matrix: it is too badly conditioned"});
}

}  // namespace

SmMatrix* hermite_form(Run& run, Factorization& factor) {
  ModuleSession& session = run.session();
  SmMatrix* const h = new_matrix(session, kGeneralSparse);
  const SmStatus status =
      run.clock().timed("Hermite form", [&] { return session.fn().qxsmhermite(factor.matrix(), h); });
  session.expect_ok(status, "computing the Hermite form");
  return h;
}

Report run_hermite(const HermiteOptions& options, const CommonOptions& common, Progress& progress) {
  Run run("hermite", {options.matrix}, common, progress);
  require_symmetric(run.matrix());
  const auto output = run.open_output();
  Factorization* const factor = run.factored();
  if (!factor) return run.finish();
  SmMatrix* const h = hermite_form(run, *factor);
  report_outcome(run.report(), *factor);
  report_trace(run, trace_of(run.session(), h), factor->rank());
  const std::int64_t count =
      write_matrix(output.get(), *h, comment_text("Hermite form A^- A, A in " + run.matrix().name));
  run.report().add("hermite_entries", count, "Hermite form", fmt::format("{} entries", count));
  report_written(run.report(), output.get(), "written", fmt::format("{} x {}", h->rows, h->cols));
  return run.finish();
}

}  // namespace sm::cli
