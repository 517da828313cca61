// Arrays for results: what was written outside them fails the test.
#pragma once

#include <cstdint>
#include <vector>

namespace sm::test {

// What an array holds that nothing has been written to.
constexpr double kUntouched = -98765.4375;

// n doubles between guard words.
class Output {
 public:
  explicit Output(std::int64_t n, double fill = kUntouched);
  explicit Output(const std::vector<double>& start);
  ~Output() { expect_guards(); }
  Output(const Output&) = delete;
  Output& operator=(const Output&) = delete;

  double* data() { return words_.data() + kGuard; }
  std::vector<double> values() const;
  bool untouched() const;  // to the bit what it was made with
  bool cleared() const;    // positive zeros

 private:
  static constexpr std::ptrdiff_t kGuard = 9;
  void expect_guards() const;

  std::vector<double> words_;
  std::vector<double> start_;
};

}  // namespace sm::test
