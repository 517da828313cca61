// How long each part of a run took.
#pragma once

#include <chrono>
#include <string>
#include <vector>

#include "cli/progress.hpp"

namespace sm::cli {

struct Phase {
  std::string name;
  double seconds = 0.0;
  double flops = 0.0;  // 0: not counted

  double gflops() const { return flops > 0.0 && seconds > 0.0 ? flops / seconds / 1e9 : 0.0; }
};

// Names each phase on the progress line while it runs, and keeps its time.
class PhaseClock {
 public:
  explicit PhaseClock(Progress& progress) : progress_(progress) {}

  // Answers what `work` answers.
  template <class Work>
  auto timed(const std::string& name, Work work, double flops = 0.0) {
    progress_.phase(flops > 0.0 ? with_gigaflop(name, flops) : name);
    const auto begin = std::chrono::steady_clock::now();
    auto answer = work();
    const std::chrono::duration<double> seconds = std::chrono::steady_clock::now() - begin;
    add({name, seconds.count(), flops});
    return answer;
  }

  // A phase that was timed elsewhere. Those of one name are added together.
  void add(const Phase& phase);

  Progress& progress() { return progress_; }
  const std::vector<Phase>& phases() const { return phases_; }

 private:
  static std::string with_gigaflop(const std::string& name, double flops);

  Progress& progress_;
  std::vector<Phase> phases_;
};

}  // namespace sm::cli
