#include "cli/phases.hpp"

#include <fmt/core.h>

#include <algorithm>

namespace sm::cli {

void PhaseClock::add(const Phase& phase) {
  const auto same = std::find_if(phases_.begin(), phases_.end(), [&](const Phase& p) { return p.name == phase.name; });
  if (same == phases_.end()) {
    phases_.push_back(phase);
  } else {
    same->seconds += phase.seconds;
    same->flops += phase.flops;
  }
}

std::string PhaseClock::with_gigaflop(const std::string& name, double flops) {
  return fmt::format("{} ({:.3g} Gflop)", name, flops / 1e9);
}

}  // namespace sm::cli
