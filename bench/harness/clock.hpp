// Seconds of one thread's work. The processor's time of the process is the default: everything here runs on one thread,
// and it leaves out what other programs took from us. `bench/run --clock wall` takes the wall's.
#pragma once

#include <ctime>

namespace sm::bench {

enum class Clock { cpu, wall };

inline Clock& chosen_clock() {
  static Clock clock = Clock::cpu;
  return clock;
}

inline double now() {
  timespec t{};
  clock_gettime(chosen_clock() == Clock::cpu ? CLOCK_PROCESS_CPUTIME_ID : CLOCK_MONOTONIC, &t);
  return static_cast<double>(t.tv_sec) + 1e-9 * static_cast<double>(t.tv_nsec);
}

template <class Work>
double seconds_of(Work&& work) {
  const double begin = now();
  work();
  return now() - begin;
}

// For work that can be repeated and may be too short for the clock: the mean over at least a fiftieth of a second.
template <class Work>
double seconds_per_call(Work&& work) {
  constexpr double enough = 0.02;
  double total = 0.0;
  long calls = 0;
  for (long batch = 1; total < enough; batch *= 2) {
    total += seconds_of([&] {
      for (long k = 0; k < batch; ++k) work();
    });
    calls += batch;
  }
  return total / static_cast<double>(calls);
}

}  // namespace sm::bench
