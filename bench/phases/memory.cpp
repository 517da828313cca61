// The peak of a factorization job once the matrix is closed: what the closed matrix holds, and by how much the resident
// set of the process grew above that while it was factored.
#include "bench/harness/memory.hpp"

#include <cstdio>

#include "bench/phases/phases.hpp"

namespace sm::bench {

void measure_memory(Workbench& bench) {
  if (!bench.can_factor({"memory"})) return;
  const Problem& problem = bench.problem();
  const std::uint64_t before = bench.module().bytes_in_use();
  auto matrix = qxhost::Matrix::symmetric_sparse(bench.module().instance(), problem.n);
  enter(bench.module().fn(), matrix, problem.upper);
  expect_ok(bench.module().fn().qxsmclose(matrix, 0.0), "closing");
  const auto closed = static_cast<double>(bench.module().bytes_in_use() - before);
  bench.module().trim();
  bench.module().keep_freed_memory(Module::Kept::usual);
  if (!forget_peak()) return;
  const double begin = resident("VmRSS");
  expect_ok(bench.module().fn().qxsmfact(matrix, 0), "factoring");
  bench.module().keep_freed_memory(Module::Kept::much);
  const double peak = closed + resident("VmHWM") - begin;
  const auto factor = static_cast<double>(matrix->factor_iu[problem.n]);
  const double bound = 9.5 * factor + 60.0 * static_cast<double>(matrix->nnz) + 120.0 * problem.n;
  bench.record("memory", "", {}, {{"closed", closed}, {"peak", peak}, {"bound", bound}, {"factor_entries", factor}});
  std::fprintf(stderr, "    peak %.1f MB, bound %.1f MB\n", 1e-6 * peak, 1e-6 * bound);
}

}  // namespace sm::bench
