// Solves with a factor that is there: one right-hand side, and 32 at once.
#include <fmt/format.h>

#include <memory>

#include "bench/harness/clock.hpp"
#include "bench/peers/cholmod.hpp"
#include "bench/phases/phases.hpp"

namespace sm::bench {
namespace {

struct Peer {
  std::string name;
  std::unique_ptr<Cholmod> cholmod;
};

// Supernodal factors are made first and copied into simplicial form, which is far quicker than a simplicial
// factorization when there is much fill.
std::vector<Peer> factored_peers(Workbench& bench) {
  std::vector<Peer> peers;
  if (!bench.problem().definite()) return peers;
  for (const auto& [name, ordering] : {std::pair{"same order", Ordering::given}, {"METIS", Ordering::metis}}) {
    for (const auto& [form, simplicial] : {std::pair{"supernodal", false}, {"simplicial", true}}) {
      const std::vector<int>* order = ordering == Ordering::given ? &bench.permutation() : nullptr;
      auto& peer = peers.emplace_back(fmt::format("CHOLMOD {}, {}", form, name),
                                      std::make_unique<Cholmod>(bench.rows(), ordering, Kind::supernodal, order));
      peer.cholmod->analyse();
      peer.cholmod->factorize();
      if (simplicial) peer.cholmod->make_simplicial();
    }
  }
  return peers;
}

std::string block_fault(const UpperRows& rows, const double* x, const std::vector<double>& b) {
  const auto n = static_cast<std::size_t>(rows.n);
  for (std::size_t k = 0; k * n < b.size(); ++k) {
    const auto begin = b.begin() + static_cast<std::ptrdiff_t>(k * n);
    std::string fault = solution_fault(rows, x + k * n, {begin, begin + rows.n});
    if (!fault.empty()) return fault;
  }
  return "";
}

// Vectors that one pass over the factor serves: those of cholesky/substitution.hpp with AVX-512.
constexpr int kVectorsAPass = 16;

// What must move at least. A pass down and one up read values, subscripts, and where both begin; one of them the
// diagonal; and each vector is read by its permutation and written. Where nearly all rows are small leaves, as those of
// subjects are, one pass does for all vectors.
double least_bytes(const SmMatrix& factor, int count, bool one_pass) {
  const auto n = static_cast<double>(factor.rows);
  const auto entries = static_cast<double>(factor.factor_iu[factor.rows]);
  const int passes = one_pass ? 1 : (count + kVectorsAPass - 1) / kVectorsAPass;
  return 8.0 * (passes * (2.0 * entries + 2.0 * kept_subscripts(factor) + 5.0 * n) + 3.0 * n * count);
}

}  // namespace

void measure_solves(Workbench& bench) {
  if (!bench.can_factor({"solve"})) return;
  SmMatrix* ours = bench.factored();
  const std::vector<Peer> peers = factored_peers(bench);
  for (const int count : {1, 32}) {
    const std::vector<double> b = bench.right_hand_sides(count);
    std::vector<double> x(b.size());
    const double* of_peer = nullptr;
    std::vector<Contestant> contestants = {
        {kOurs,
         [&] {
           return seconds_per_call(
               [&] { expect_ok(bench.module().fn().qxsmsubst(ours, b.data(), x.data(), count), "solving"); });
         },
         [&] { return block_fault(bench.rows(), x.data(), b); }}};
    for (const Peer& peer : peers) {
      contestants.push_back({peer.name,
                             [&] { return seconds_per_call([&] { of_peer = peer.cholmod->solve(b.data(), count); }); },
                             [&] { return block_fault(bench.rows(), of_peer, b); }});
    }
    const double entries = static_cast<double>(ours->factor_iu[ours->rows]);
    bench.record("solve", fmt::format("{} right-hand side{}", count, count == 1 ? "" : "s"),
                 bench.race(fmt::format("solve{}", count), contestants),
                 {{"factor_entries", entries},
                  {"count", count},
                  {"bytes", least_bytes(*ours, count, bench.problem().family == "f")},
                  {"flops", 4.0 * entries * count}});
  }
}

}  // namespace sm::bench
