// Minimum degree by the module, AMD and METIS, with the fill that each leads to.
#include "bench/harness/clock.hpp"
#include "bench/peers/cholmod.hpp"
#include "bench/peers/orderings.hpp"
#include "bench/phases/phases.hpp"

namespace sm::bench {

void measure_ordering(Workbench& bench) {
  const UpperRows& rows = bench.rows();
  SmMatrix* closed = bench.closed();
  std::vector<int> ours, by_amd, by_metis;
  Graph graph(rows);
  const auto run_ours = [&] {
    const qxhost::Matrix copy = bench.copy_of(closed);
    const double seconds = seconds_of([&] { expect_ok(bench.module().by_name().qxsmmd(copy), "ordering"); });
    ours.assign(copy->perm, copy->perm + rows.n);
    return seconds;
  };
  const auto check = [&](const std::vector<int>& order) {
    return [&order, &rows] { return permutation_fault(order, rows.n); };
  };
  const std::vector<Outcome> outcomes = bench.race(
      "ordering", {{kOurs, run_ours, check(ours)},
                   {"AMD", [&] { return seconds_of([&] { order_by_amd(rows, by_amd); }); }, check(by_amd)},
                   {"METIS", [&] { return seconds_of([&] { order_by_metis(graph, by_metis); }); }, check(by_metis)}});
  // Both triangles in words of half the length, each paired with one for the elements.
  Json facts = {{"graph_bytes", 16.0 * (rows.entries() - rows.n)}};
  for (const auto& [name, order] : {std::pair{kOurs, &ours}, {"AMD", &by_amd}, {"METIS", &by_metis}}) {
    if (!permutation_fault(*order, rows.n).empty()) continue;
    const Fill fill = fill_of(rows, *order);
    facts["fill"][name] = {{"entries", fill.entries}, {"flops", fill.flops}};
  }
  bench.record("ordering", "", outcomes, facts);
}

}  // namespace sm::bench
