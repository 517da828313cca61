#include "bench/harness/race.hpp"

#include <fmt/format.h>

#include <algorithm>

namespace sm::bench {
namespace {

constexpr double kLong = 4.0;       // seconds of one run beyond which three will do
constexpr double kVeryLong = 20.0;  // and beyond which one will

int rounds_of(const Outcome& outcome, int rounds) {
  if (!outcome.not_run.empty()) return 0;
  if (outcome.seconds.empty() || outcome.seconds.front() < kLong) return rounds;
  return std::min(rounds, outcome.seconds.front() < kVeryLong ? 3 : 1);
}

}  // namespace

double Outcome::median() const {
  std::vector<double> sorted = seconds;
  std::sort(sorted.begin(), sorted.end());
  const std::size_t half = sorted.size() / 2;
  return sorted.size() % 2 == 1 ? sorted[half] : 0.5 * (sorted[half - 1] + sorted[half]);
}

std::vector<Outcome> run_race(const Race& race, const std::vector<Contestant>& contestants, Forecast& forecast) {
  std::vector<Outcome> outcomes;
  for (const Contestant& c : contestants) {
    Outcome& outcome = outcomes.emplace_back();
    outcome.name = c.name;
    const std::string job = race.job + "/" + c.name;
    if (forecast.too_long(job, race.n)) {
      outcome.not_run = fmt::format("about {:.0f} s expected", forecast.expected(job, race.n));
    }
  }
  for (int round = 0; round < race.rounds; ++round) {
    for (std::size_t k = 0; k < contestants.size(); ++k) {
      if (round >= rounds_of(outcomes[k], race.rounds)) continue;
      outcomes[k].seconds.push_back(contestants[k].run());
      if (outcomes[k].fault.empty()) outcomes[k].fault = contestants[k].fault();
    }
  }
  for (const Outcome& outcome : outcomes) {
    if (!outcome.seconds.empty()) forecast.learn(race.job + "/" + outcome.name, race.n, outcome.median());
  }
  return outcomes;
}

}  // namespace sm::bench
