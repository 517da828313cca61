#include "bench/harness/latency.hpp"

#include <algorithm>
#include <numeric>

#include "bench/generators/random.hpp"
#include "bench/harness/clock.hpp"

namespace sm::bench {
namespace {

struct alignas(64) Line {
  const Line* next = nullptr;
};

// `loads` of them, one after the other; where they end.
const Line* chase(const Line* line, std::size_t loads) {
  for (std::size_t k = 0; k < loads; ++k) line = line->next;
  return line;
}

constexpr std::size_t kRun = 8;

// Not in vectors: no processor stores to many places at a time faster than to one after the other.
__attribute__((noinline, optimize("no-tree-vectorize"))) void add_run(double* y, const std::int64_t* place,
                                                                      const double* x, double a) {
  for (std::size_t k = 0; k < kRun; ++k) y[place[k]] += a * x[k];
}

__attribute__((noinline)) void add_vector(double* __restrict y, const double* __restrict x, double a,
                                          std::size_t count) {
  for (std::size_t k = 0; k < count; ++k) y[k] += a * x[k];
}

}  // namespace

// Sattolo, "An algorithm to generate a random cyclic permutation", Information Processing Letters 22, 1986.
std::vector<std::uint32_t> random_cycle(std::uint32_t count) {
  std::vector<std::uint32_t> next(count);
  std::iota(next.begin(), next.end(), 0u);
  Random random(17);
  for (std::uint32_t k = count; k-- > 1;) std::swap(next[k], next[random.bits() % k]);
  return next;
}

double dependent_load(std::size_t bytes) {
  constexpr std::size_t kLoads = std::size_t{1} << 20;
  constexpr int kTimes = 5;
  const std::vector<std::uint32_t> next = random_cycle(static_cast<std::uint32_t>(bytes / sizeof(Line)));
  std::vector<Line> lines(next.size());
  for (std::size_t k = 0; k < next.size(); ++k) lines[k].next = &lines[next[k]];
  const Line* volatile at = chase(lines.data(), std::min(kLoads, lines.size()));  // volatile: the chase is not left out
  double least = 1e300;
  for (int k = 0; k < kTimes; ++k) least = std::min(least, seconds_of([&] { at = chase(at, kLoads); }));
  return least / static_cast<double>(kLoads);
}

double scattered_addition(std::size_t bytes) {
  constexpr std::size_t kAdditions = std::size_t{1} << 20;
  constexpr int kTimes = 5;
  std::vector<double> y(bytes / sizeof(double));
  std::vector<std::int64_t> place(std::max(std::size_t{1} << 14, y.size() / kRun));  // about each line once
  Random random(23);
  for (auto& p : place) p = static_cast<std::int64_t>(random.bits() % y.size());
  for (auto run = place.begin(); run != place.end(); run += kRun) std::sort(run, run + kRun);
  const std::vector<double> x(place.size(), 1.0);
  const auto pass = [&] {
    for (std::size_t done = 0; done < kAdditions; done += place.size()) {
      for (std::size_t k = 0; k < place.size(); k += kRun) add_run(y.data(), &place[k], &x[k], 0.5);
    }
  };
  double least = 1e300;
  for (int k = 0; k < kTimes; ++k) least = std::min(least, seconds_of(pass));
  return least / static_cast<double>(kAdditions);
}

__attribute__((noinline, optimize("no-tree-vectorize"))) double exchange(const std::int64_t* place, const double* value,
                                                                         std::size_t count, const double* x,
                                                                         double* y) {
  constexpr std::size_t kSums = 4;  // so that no addition waits for the one before
  double sum[kSums] = {};
  std::size_t k = 0;
  for (; k + kSums <= count; k += kSums) {
    for (std::size_t s = 0; s < kSums; ++s) {
      sum[s] += value[k + s] * x[place[k + s]];
      y[place[k + s]] += 0.5 * value[k + s];
    }
  }
  for (; k < count; ++k) {
    sum[0] += value[k] * x[place[k]];
    y[place[k]] += 0.5 * value[k];
  }
  return (sum[0] + sum[1]) + (sum[2] + sum[3]);
}

double vector_update(std::size_t bytes) {
  constexpr int kTimes = 5, kPasses = 20;
  const std::size_t count = bytes / (2 * sizeof(double));
  std::vector<double> y(count, 0.0);
  const std::vector<double> x(count, 1.0);
  double least = 1e300;
  for (int time = 0; time < kTimes; ++time) {
    least = std::min(least, seconds_of([&] {
                       for (int k = 0; k < kPasses; ++k) add_vector(y.data(), x.data(), 0.5, count);
                     }));
  }
  return kPasses * 3.0 * sizeof(double) * static_cast<double>(count) / least;
}

}  // namespace sm::bench
