// Conjugate gradients with a diagonal preconditioner: the time of a step.
#include <algorithm>
#include <cmath>

#include "bench/harness/clock.hpp"
#include "bench/peers/eigen.hpp"
#include "bench/phases/phases.hpp"

namespace sm::bench {
namespace {

constexpr int kSteps = 50;    // of a timed run
constexpr int kCompared = 8;  // steps after which two programs still agree to kAgreement on any of the families
constexpr double kAgreement = 1e-6;

std::string iterate_fault(const std::vector<double>& got, const std::vector<double>& want) {
  double largest = 0.0;
  for (const double v : want) largest = std::max(largest, std::fabs(v));
  for (std::size_t i = 0; i < want.size(); ++i) {
    if (!(std::fabs(got[i] - want[i]) <= kAgreement * largest)) return "another iterate than the peer's";
  }
  return "";
}

}  // namespace

void measure_iterations(Workbench& bench) {
  if (!bench.problem().definite()) return;
  const std::vector<double>& b = bench.problem().rhs;
  SmMatrix* closed = bench.closed();
  std::vector<double> x(b.size()), theirs;
  // Stops at the limit of steps (109), or sooner with 0 where the residual has become 0.
  const auto iterate = [&](int steps) {
    std::int64_t taken = 0;
    double rho = 0.0;
    const SmStatus status = bench.module().fn().qxsmsolioc(closed, b.data(), x.data(), 1, steps, &taken, &rho, 0.0);
    if (status != SM_NOT_CONVERGED) expect_ok(status, "iterating");
    return taken;
  };
  std::int64_t taken = 0;
  const auto run_ours = [&] { return seconds_of([&] { taken = iterate(kSteps); }) / kSteps; };
  const auto fault_of_ours = [&]() -> std::string {
    if (taken != kSteps) return number_fault("steps", static_cast<double>(taken), kSteps, 0.0, 0.0);
    iterate(kCompared);
    iterate_by_eigen(bench.rows(), b, theirs, kCompared);
    return iterate_fault(x, theirs);
  };
  const auto run_eigen = [&] { return iterate_by_eigen(bench.rows(), b, theirs, kSteps) / kSteps; };
  const auto fault_of_eigen = [&] {
    iterate(kCompared);
    iterate_by_eigen(bench.rows(), b, theirs, kCompared);
    return iterate_fault(theirs, x);
  };
  const double bytes = 16.0 * bench.rows().entries() + 8.0 * bench.rows().n;
  // Beside the matrix: direction, its image, solution and residual read and written, the diagonal read.
  const double vectors = 8.0 * 9.0 * bench.rows().n;
  bench.record("iteration", "",
               bench.race("iteration", {{kOurs, run_ours, fault_of_ours}, {"Eigen", run_eigen, fault_of_eigen}}),
               {{"matrix_bytes", bytes}, {"bytes", bytes + vectors}});
}

}  // namespace sm::bench
