// What a job will take, judged by its smaller sizes, so that one that would run for hours is left out and said so.
#pragma once

#include <map>
#include <string>

namespace sm::bench {

class Forecast {
 public:
  explicit Forecast(double longest) : longest_(longest) {}

  // `job` names family, phase and program.
  void learn(const std::string& job, double n, double seconds);
  // 0 when nothing is known.
  [[nodiscard]] double expected(const std::string& job, double n) const;
  [[nodiscard]] bool too_long(const std::string& job, double n) const { return expected(job, n) > longest_; }

 private:
  struct Point {
    double n = 0.0, seconds = 0.0;
  };
  struct Known {
    Point last, before;
  };
  double longest_;
  std::map<std::string, Known> known_;
};

}  // namespace sm::bench
