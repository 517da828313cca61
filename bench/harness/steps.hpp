// A job whose steps are timed one by one, over several runs.
#pragma once

#include <string>
#include <utility>
#include <vector>

#include "bench/harness/clock.hpp"
#include "bench/harness/race.hpp"
#include "bench/harness/records.hpp"

namespace sm::bench {

class Steps {
 public:
  // The seconds of this step in this run.
  template <class Work>
  double time(const std::string& step, Work&& work) {
    const double seconds = seconds_of(std::forward<Work>(work));
    runs_of(step).push_back(seconds);
    return seconds;
  }
  // The median of each, in the order in which they were first taken.
  [[nodiscard]] Json medians() const {
    Json json = Json::object();
    for (const Outcome& step : steps_) json[step.name] = step.median();
    return json;
  }

 private:
  std::vector<double>& runs_of(const std::string& step) {
    for (Outcome& known : steps_) {
      if (known.name == step) return known.seconds;
    }
    return steps_.emplace_back(Outcome{.name = step, .seconds = {}, .fault = "", .not_run = ""}).seconds;
  }
  std::vector<Outcome> steps_;
};

}  // namespace sm::bench
