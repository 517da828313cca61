// Entering contributions one by one, in the order of the problem and in random order, and closing.
#include <algorithm>
#include <memory>
#include <optional>

#include "bench/harness/clock.hpp"
#include "bench/peers/eigen.hpp"
#include "bench/peers/maps.hpp"
#include "bench/phases/phases.hpp"

namespace sm::bench {
namespace {

UpperRows rows_of(const SmMatrix* matrix) {
  UpperRows rows{.n = static_cast<int>(matrix->rows), .start = {}, .col = {}, .value = {}};
  for (std::int64_t i = 0; i <= matrix->rows; ++i) rows.start.push_back(static_cast<int>(matrix->row_start[i]));
  for (std::int64_t p = 0; p < matrix->nnz; ++p) rows.col.push_back(static_cast<int>(matrix->col_index[p]));
  rows.value.assign(matrix->nz_values, matrix->nz_values + matrix->nnz);
  return rows;
}

// The same contestants with the times of the closing that followed each run.
std::vector<Outcome> closings(std::vector<Outcome> outcomes, const std::vector<std::vector<double>>& seconds) {
  outcomes.resize(seconds.size());
  for (std::size_t k = 0; k < seconds.size(); ++k) outcomes[k].seconds = seconds[k];
  return outcomes;
}

// The call alone: a matrix without a size takes every entry for nothing to do.
double seconds_of_a_call(Workbench& bench, const Triplets& entries) {
  const SmFunctionTable& fn = bench.module().fn();
  qxhost::Matrix unsized = qxhost::Matrix::symmetric_sparse(bench.module().instance(), 0);
  enter(fn, unsized, entries);
  return seconds_of([&] { enter(fn, unsized, entries); }) / static_cast<double>(entries.size());
}

void measure(Workbench& bench, const char* variant, const Triplets& entries) {
  const Problem& problem = bench.problem();
  const SmFunctionTable& fn = bench.module().fn();
  std::vector<std::vector<double>> closing(2);

  std::optional<qxhost::Matrix> ours;
  const auto run_ours = [&] {
    ours.reset();
    ours = qxhost::Matrix::symmetric_sparse(bench.module().instance(), problem.n);
    expect_ok(ours->status(), "making a matrix");
    const double seconds = seconds_of([&] { enter(fn, *ours, entries); });
    closing[0].push_back(seconds_of([&] { expect_ok(fn.qxsmclose(*ours, 0.0), "closing"); }));
    return seconds;
  };
  UpperRows from_maps;
  const auto run_maps = [&] {
    MapAssembly maps(problem.n);
    const double seconds = seconds_of([&] { maps.enter(entries); });
    closing[1].push_back(seconds_of([&] { maps.close(from_maps); }));
    return seconds;
  };
  EigenAssembly eigen(problem, entries);

  const std::vector<Outcome> outcomes =
      bench.race("assembly", {{kOurs, run_ours, [&] { return rows_fault(rows_of(*ours), bench.rows()); }},
                              {"std::map", run_maps, [&] { return rows_fault(from_maps, bench.rows()); }},
                              {"Eigen setFromTriplets", [&] { return seconds_of([&] { eigen.run(); }); },
                               [&] { return eigen.fault(bench.rows()); }}});
  const double trees = static_cast<double>(sizeof(NonzeroNode)) * bench.rows().entries() + 8.0 * problem.n;
  const Json facts = {
      {"contributions", entries.size()}, {"tree_bytes", trees}, {"call", seconds_of_a_call(bench, entries)}};
  bench.record("assembly", variant, outcomes, facts);
  bench.record("closing", variant, closings(outcomes, closing), facts);
}

}  // namespace

void measure_assembly(Workbench& bench) {
  measure(bench, "natural order", bench.problem().upper);
  measure(bench, "random order", shuffled(bench.problem().upper));
}

}  // namespace sm::bench
