// From a closed matrix to a solution, everyone with an ordering of their own.
#include <fmt/format.h>

#include <map>

#include "bench/harness/clock.hpp"
#include "bench/harness/steps.hpp"
#include "bench/peers/cholmod.hpp"
#include "bench/peers/eigen.hpp"
#include "bench/peers/orderings.hpp"
#include "bench/phases/phases.hpp"

namespace sm::bench {
namespace {

double run_ours(Workbench& bench, std::vector<double>& x) {
  const qxhost::Matrix matrix = bench.copy_of(bench.closed());
  const SmFunctionTable& fn = bench.module().fn();
  x.resize(bench.problem().rhs.size());
  return seconds_of([&] {
    expect_ok(fn.qxsmfact(matrix, 0), "factoring");
    expect_ok(fn.qxsmsubst(matrix, bench.problem().rhs.data(), x.data(), 1), "solving");
  });
}

// The same one step after the other, a run of its own: what the steps share among them.
double run_our_steps(Workbench& bench, Steps& steps, std::vector<double>& x) {
  const qxhost::Matrix matrix = bench.copy_of(bench.closed());
  const Exports& step = bench.module().by_name();
  x.resize(bench.problem().rhs.size());
  double seconds = steps.time("ordering", [&] { expect_ok(step.qxsmmd(matrix), "ordering"); });
  seconds += steps.time("symbolic", [&] {
    expect_ok(step.qxsmreorder(matrix), "reordering");
    expect_ok(step.qxsmsymbfact(matrix), "symbolic factorization");
  });
  seconds += steps.time("numeric", [&] { expect_ok(step.qxsmnumfact(matrix), "numeric factorization"); });
  return seconds + steps.time("solve", [&] {
    expect_ok(bench.module().fn().qxsmsubst(matrix, bench.problem().rhs.data(), x.data(), 1), "solving");
  });
}

// With METIS, its graph included in the time.
double run_ours_with_metis(Workbench& bench, std::vector<double>& x) {
  const qxhost::Matrix matrix = bench.copy_of(bench.closed());
  const SmFunctionTable& fn = bench.module().fn();
  x.resize(bench.problem().rhs.size());
  return seconds_of([&] {
    Graph graph(bench.rows());
    std::vector<int> order;
    order_by_metis(graph, order);
    const std::vector<std::int64_t> wide(order.begin(), order.end());
    expect_ok(bench.module().by_name().qxsmorder(matrix, wide.data()), "giving an order");
    expect_ok(fn.qxsmfact(matrix, 0), "factoring");
    expect_ok(fn.qxsmsubst(matrix, bench.problem().rhs.data(), x.data(), 1), "solving");
  });
}

double run_cholmod(Workbench& bench, Ordering ordering, Kind kind, Steps& steps, std::vector<double>& x) {
  Cholmod cholmod(bench.rows(), ordering, kind);
  const double* solution = nullptr;
  const double seconds = seconds_of([&] {
    steps.time("analysis", [&] { cholmod.analyse(); });
    steps.time("numeric", [&] { cholmod.factorize(); });
    steps.time("solve", [&] { solution = cholmod.solve(bench.problem().rhs.data(), 1); });
  });
  x.assign(solution, solution + bench.problem().n);
  return seconds;
}

constexpr const char* kEigen = "Eigen SimplicialLDLT";

// Eigen's steps cost it something, so they are timed beside the race, and only where it is the fastest peer.
bool is_fastest_peer(const std::vector<Outcome>& outcomes, const std::string& name) {
  const Outcome* fastest = nullptr;
  for (const Outcome& outcome : outcomes) {
    if (!outcome.counts() || outcome.name.starts_with(kOurs)) continue;
    if (!fastest || outcome.median() < fastest->median()) fastest = &outcome;
  }
  return fastest && fastest->name == name;
}

}  // namespace

void measure_total(Workbench& bench) {
  if (!bench.can_factor({"total"})) return;
  const std::vector<double>& b = bench.problem().rhs;
  std::vector<double> x;
  std::map<std::string, Steps> steps;
  std::vector<Contestant> contestants;
  const auto add = [&](std::string name, std::function<double()> run) {
    contestants.push_back({std::move(name), std::move(run), [&] { return solution_fault(bench.rows(), x.data(), b); }});
  };
  add(kOurs, [&] { return run_ours(bench, x); });
  add(fmt::format("{}, in steps", kOurs), [&] { return run_our_steps(bench, steps[kOurs], x); });
  if (bench.module().by_name().qxsmorder) {
    add(fmt::format("{}, METIS", kOurs), [&] { return run_ours_with_metis(bench, x); });
  }
  if (bench.problem().definite()) {  // the peers have no answer to a singular matrix
    for (const auto& [name, ordering] : {std::pair{"AMD", Ordering::amd}, {"METIS", Ordering::metis}}) {
      for (const auto& [form, kind] : {std::pair{"simplicial", Kind::simplicial}, {"supernodal", Kind::supernodal}}) {
        const std::string peer = fmt::format("CHOLMOD {}, {}", form, name);
        add(peer, [&bench, &x, &taken = steps[peer], ordering, kind] {
          return run_cholmod(bench, ordering, kind, taken, x);
        });
      }
    }
    add(kEigen, [&] { return seconds_of([&] { solve_by_eigen(bench.rows(), b, x); }); });
  }
  const std::vector<Outcome> outcomes = bench.race("total", contestants);
  if (is_fastest_peer(outcomes, kEigen)) {
    for (int k = 0; k < 3; ++k) solve_by_eigen(bench.rows(), b, x, steps[kEigen]);
  }
  Json facts = Json::object();
  for (const auto& [name, taken] : steps) facts["steps"][name] = taken.medians();
  bench.record("total", "", outcomes, facts);
}

}  // namespace sm::bench
