#include "bench/harness/forecast.hpp"

#include <algorithm>
#include <cmath>

namespace sm::bench {
namespace {

constexpr double kAssumed = 2.0;  // the exponent after one size: that of a factorization in three dimensions
constexpr double kShallow = 1.0;  // what two sizes may say
constexpr double kSteep = 2.5;
constexpr double kBarely = 1e-4;  // times below this say nothing about growth

}  // namespace

void Forecast::learn(const std::string& job, double n, double seconds) {
  Known& known = known_[job];
  if (known.last.n != n) known.before = known.last;
  known.last = {n, seconds};
}

double Forecast::expected(const std::string& job, double n) const {
  const auto found = known_.find(job);
  if (found == known_.end()) return 0.0;
  const auto& [last, before] = found->second;
  double exponent = kAssumed;
  if (before.n > 0.0 && before.seconds > kBarely && last.n > before.n) {
    exponent = std::log(last.seconds / before.seconds) / std::log(last.n / before.n);
  }
  return last.seconds * std::pow(n / last.n, std::clamp(exponent, kShallow, kSteep));
}

}  // namespace sm::bench
