// The rank of singular matrices, and how near their pivots come to the bound.
#include <cstdio>

#include "bench/peers/pivots.hpp"
#include "bench/phases/phases.hpp"

namespace sm::bench {

void measure_rank(Workbench& bench) {
  if (bench.problem().definite() || !bench.can_factor({"rank"})) return;
  const double tolerance = bench.module().instance().get()->tolerances[2];
  const auto rank = static_cast<double>(bench.factored()->rank);
  const PivotMargins margins = pivot_margins(bench.rows(), bench.permutation(), tolerance);
  bench.record("rank", "", {},
               {{"rank", rank},
                {"expected", bench.problem().rank},
                {"plain_rank", margins.accepted},
                {"largest_dropped", margins.largest_dropped},
                {"smallest_accepted", margins.smallest_accepted}});
  std::fprintf(stderr, "    rank %.0f of %d; dropped up to %.3g of the bound, accepted from %.3g\n", rank,
               bench.problem().rank, margins.largest_dropped, margins.smallest_accepted);
}

}  // namespace sm::bench
