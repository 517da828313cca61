#include "support/output.hpp"

#include <gtest/gtest.h>

#include <algorithm>

#include "support/matrices.hpp"

namespace sm::test {

namespace {

constexpr double kBefore = -31.25;
constexpr double kBehind = 41.75;

}  // namespace

Output::Output(std::int64_t n, double fill) : Output(std::vector<double>(at(n), fill)) {}

Output::Output(const std::vector<double>& start) : start_(start) {
  words_.assign(at(kGuard), kBefore);
  words_.insert(words_.end(), start.begin(), start.end());
  words_.insert(words_.end(), at(kGuard), kBehind);
}

void Output::expect_guards() const {
  for (std::ptrdiff_t k = 0; k < kGuard; ++k) {
    EXPECT_EQ(words_[at(k)], kBefore) << "written before the array";
    EXPECT_EQ(words_[words_.size() - 1 - at(k)], kBehind) << "written behind the array";
  }
}

std::vector<double> Output::values() const {
  expect_guards();
  return {words_.begin() + kGuard, words_.end() - kGuard};
}

bool Output::untouched() const { return bits(values()) == bits(start_); }

bool Output::cleared() const {
  const std::vector<double> v = values();
  return std::all_of(v.begin(), v.end(), [](double x) { return bits(x) == 0; });
}

}  // namespace sm::test
