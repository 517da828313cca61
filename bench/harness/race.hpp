// Programs that do the same job take turns, so that what disturbs one disturbs the others; each is timed five times,
// fewer when a run is long, and every result is checked.
#pragma once

#include <functional>
#include <string>
#include <vector>

#include "bench/harness/forecast.hpp"

namespace sm::bench {

struct Contestant {
  std::string name;
  std::function<double()> run;         // does the job once; the seconds of the part that counts
  std::function<std::string()> fault;  // asked after each run: what is wrong with the result, empty when it is right
};

struct Outcome {
  std::string name;
  std::vector<double> seconds;  // of each run, in order
  std::string fault;            // not empty: the times do not count
  std::string not_run;          // not empty: why there are none

  [[nodiscard]] bool counts() const { return fault.empty() && not_run.empty(); }
  [[nodiscard]] double median() const;
};

// The module's own name among the contestants.
inline constexpr const char* kOurs = "qxesm";

struct Race {
  std::string job;  // family and phase, for the forecast
  double n = 0.0;
  int rounds = 5;
};

std::vector<Outcome> run_race(const Race& race, const std::vector<Contestant>& contestants, Forecast& forecast);

}  // namespace sm::bench
