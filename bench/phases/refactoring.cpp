// A loop of fits: new values on the same pattern, numeric factorization, nothing else.
#include <array>

#include "bench/harness/clock.hpp"
#include "bench/harness/steps.hpp"
#include "bench/peers/cholmod.hpp"
#include "bench/phases/phases.hpp"

namespace sm::bench {
namespace {

// Two sets of values of one definite matrix, the second with a heavier diagonal.
std::array<std::vector<double>, 2> values_of(const UpperRows& rows) {
  std::array<std::vector<double>, 2> values{rows.value, rows.value};
  for (int i = 0; i < rows.n; ++i) values[1][static_cast<std::size_t>(rows.start[static_cast<std::size_t>(i)])] *= 1.25;
  return values;
}

}  // namespace

void measure_refactoring(Workbench& bench) {
  if (!bench.problem().definite() || !bench.can_factor({"refactor"})) return;
  const Exports& operations = bench.module().by_name();
  if (!operations.qxsmrefill) {
    bench.record("refactor", "",
                 {{.name = kOurs, .seconds = {}, .fault = "", .not_run = "the module exports no qxsmrefill"}});
    return;
  }
  const auto values = values_of(bench.rows());
  const std::vector<double>& b = bench.problem().rhs;
  qxhost::Matrix matrix = bench.copy_of(bench.factored());
  expect_ok(operations.qxsmrefill(matrix, values[0].data()), "refilling");  // the first call makes the map
  expect_ok(operations.qxsmnumfact(matrix), "numeric factorization");
  UpperRows current = bench.rows();
  std::size_t turn = 0;
  Steps steps;
  std::uint64_t grown = 0;
  const auto run_ours = [&] {
    current.value = values[++turn % 2];
    const std::uint64_t before = bench.module().bytes_in_use();
    const double seconds = seconds_of([&] {
      steps.time("refilling", [&] { expect_ok(operations.qxsmrefill(matrix, current.value.data()), "refilling"); });
      steps.time("numeric", [&] { expect_ok(operations.qxsmnumfact(matrix), "numeric factorization"); });
    });
    grown += bench.module().bytes_in_use() - before;
    return seconds;
  };
  std::vector<double> x(b.size());
  const auto fault_of_ours = [&]() -> std::string {
    if (grown != 0) return "memory grew";
    expect_ok(bench.module().fn().qxsmsubst(matrix, b.data(), x.data(), 1), "solving");
    return solution_fault(current, x.data(), b);
  };

  std::vector<Contestant> contestants = {{kOurs, run_ours, fault_of_ours}};
  Cholmod simplicial(bench.rows(), Ordering::given, Kind::simplicial, &bench.permutation());
  Cholmod supernodal(bench.rows(), Ordering::given, Kind::supernodal, &bench.permutation());
  for (const auto& [name, peer] : {std::pair{"CHOLMOD simplicial", &simplicial}, {"CHOLMOD supernodal", &supernodal}}) {
    peer->analyse();
    contestants.push_back({name,
                           [&, peer = peer] {
                             peer->refill(current.value);
                             return seconds_of([&] { peer->factorize(); });
                           },
                           [&, peer = peer] { return solution_fault(current, peer->solve(b.data(), 1), b); }});
  }
  const std::vector<Outcome> outcomes = bench.race("refactor", contestants);
  Json facts = steps.medians();
  facts["refill_bytes"] = 24.0 * bench.rows().entries();  // a value read and written, and its place
  bench.record("refactor", "", outcomes, facts);
}

}  // namespace sm::bench
