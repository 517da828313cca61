#include "bench/phases/phases.hpp"

namespace sm::bench {

std::span<const Phase> phases() {
  static const std::vector<Phase> all = {
      {{"assembly", "closing"}, measure_assembly},
      {{"ordering"}, measure_ordering},
      {{"symbolic", "numeric"}, measure_factorization},
      {{"total"}, measure_total},
      {{"solve"}, measure_solves},
      {{"inverse", "trace"}, measure_inverse},
      {{"refactor"}, measure_refactoring},
      {{"product"}, measure_products},
      {{"iteration"}, measure_iterations},
      {{"memory"}, measure_memory},
      {{"rank"}, measure_rank},
  };
  return all;
}

}  // namespace sm::bench
