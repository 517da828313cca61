#include "cli/gradients.hpp"

#include <fmt/core.h>

#include <cmath>

#include "cli/facts.hpp"
#include "cli/module_matrix.hpp"

namespace sm::cli {
namespace {

// What the module's callback tells.
struct Watch {
  Progress& progress;
  double first = 0.0;                      // r' M r for x = 0
  std::vector<double>* history = nullptr;  // null: not kept

  double part(double rho) const { return rho == 0.0 ? 0.0 : std::sqrt(rho / first); }
};

std::int32_t note(void* context, double rho, std::int64_t, std::int64_t iteration) {
  Watch& watch = *static_cast<Watch*>(context);
  const double residual = watch.part(rho);
  watch.progress.iteration(iteration, residual);
  if (watch.history) watch.history->push_back(residual);
  return 0;
}

// Has the callback set for as long as it lives.
class Watching {
 public:
  Watching(ModuleSession& session, Watch& watch) : session_(session) {
    session.steps().qxsmsetprogress(session.instance(), note, &watch);
  }
  ~Watching() { session_.steps().qxsmsetprogress(session_.instance(), nullptr, nullptr); }
  Watching(const Watching&) = delete;
  Watching& operator=(const Watching&) = delete;

 private:
  ModuleSession& session_;
};

// The inverse of the diagonal, 0 where there is nothing above 0 to invert: the module's preconditioner.
std::vector<double> preconditioner(const CompressedRows& upper) {
  std::vector<double> inverse(static_cast<std::size_t>(upper.rows), 0.0);
  for (std::int64_t i = 0; i < upper.rows; ++i) {
    const auto place = find_entry(upper, i, i);
    const double d = place ? upper.value[static_cast<std::size_t>(*place)] : 0.0;
    if (d > 0.0) inverse[static_cast<std::size_t>(i)] = 1.0 / d;
  }
  return inverse;
}

// b' M b, and whether b meets a row that M leaves out.
double first_measure(const std::vector<double>& inverse, const double* b, bool& empty_row) {
  double sum = 0.0;
  for (std::size_t i = 0; i < inverse.size(); ++i) {
    sum += b[i] * (inverse[i] * b[i]);
    empty_row = empty_row || (inverse[i] == 0.0 && b[i] != 0.0);
  }
  return sum;
}

std::string progress_text(std::int64_t j, std::int64_t count) {
  return count == 1 ? "conjugate gradients" : fmt::format("conjugate gradients, {} of {}", j + 1, count);
}

}  // namespace

std::vector<GradientOutcome> solve_by_gradients(Run& run, const Columns& b, const GradientLimits& limits,
                                                bool with_history, std::vector<double>& x) {
  std::vector<GradientOutcome> outcomes(static_cast<std::size_t>(b.count));
  ModuleSession& session = run.session();
  Progress& progress = run.clock().progress();
  SmMatrix* const a = sparse_matrix(session, run.matrix(), run.clock());
  const std::vector<double> inverse = preconditioner(run.matrix().rows);
  const auto solve = [&](std::int64_t j) {
    GradientOutcome& outcome = outcomes[static_cast<std::size_t>(j)];
    const double* const column = b.values.data() + j * b.rows;
    progress.phase(progress_text(j, b.count));
    Watch watch{.progress = progress, .history = with_history ? &outcome.history : nullptr};
    watch.first = first_measure(inverse, column, outcome.empty_row);
    const Watching watching(session, watch);
    double rho = 0.0;
    const SmStatus status = session.fn().qxsmsolioc(a, column, x.data() + j * b.rows, 1, limits.max_iterations,
                                                    &outcome.iterations, &rho, limits.tolerance);
    outcome.converged = status == SM_OK;
    outcome.residual = watch.part(rho);
    return status;
  };
  const SmStatus status = run.clock().timed("iterating", [&] {
    SmStatus answer = SM_OK;
    for (std::int64_t j = 0; j < b.count && (answer == SM_OK || answer == SM_NOT_CONVERGED); ++j) answer = solve(j);
    return answer;
  });
  if (status == SM_NOT_DEFINITE) {
    report_not_definite(run.report(), run.matrix());
    return {};
  }
  if (status != SM_NOT_CONVERGED) session.expect_ok(status, "iterating");
  return outcomes;
}

}  // namespace sm::cli
