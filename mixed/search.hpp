// One search for a minimum: what optimize.hpp promises, with the state that its parts share.
//   optimize.cpp        steps, and when to stop
//   search_hessian.cpp  the Hessian that steps are taken with
#pragma once

#include <cmath>
#include <cstdint>
#include <span>
#include <string>
#include <vector>

#include "mixed/dense.hpp"
#include "mixed/optimize.hpp"
#include "mixed/trust_region.hpp"
#include "mixed/value_search.hpp"
#include "mixed/vectors.hpp"

namespace sm::mixed {

inline double scaled_norm(std::span<const double> p, std::span<const double> scale) {
  double sum = 0.0;
  for (std::size_t i = 0; i < p.size(); ++i) sum += p[i] * scale[i] * p[i] * scale[i];
  return std::sqrt(sum);
}

inline std::vector<double> shifted(std::span<const double> x, std::span<const double> p) {
  std::vector<double> y(x.begin(), x.end());
  for (std::size_t i = 0; i < y.size(); ++i) y[i] += p[i];
  return y;
}

class Search {
 public:
  Search(const Objective& objective, std::vector<double> start, const MinimiseOptions& options);
  Minimum run();

 private:
  enum class Ending { converged, stopped, stuck };

  Evaluation evaluate(std::span<const double> x);
  double natural(std::size_t i) const { return std::max(std::abs(x_[i]), 0.01 * size_); }
  std::vector<double> naturals() const;
  double difference_step(std::size_t i) const;
  void refresh();
  bool approximate();
  std::vector<double> approximation() const;
  bool follow_hessian(std::span<const double> p, std::span<const double> before);
  double nearly() const;
  void keep_radius_in_new_scale(const std::vector<double>& old);
  std::vector<double> hessian_times(std::span<const double> p) const;
  void update(std::span<const double> p, std::span<const double> gradient, std::span<const double> before);
  double shorten(TrialStep& step) const;
  double decrease(const TrialStep& step, const Evaluation& trial) const;
  bool mispredicted(const TrialStep& step, std::span<const double> gradient) const;
  void move(std::span<const double> p, Evaluation&& there);
  bool renew_model(const TrialStep& step, std::span<const double> before);
  bool report(double step);
  bool is_minimum(const Spectrum& spectrum);
  bool leads_down(std::span<const double> direction);
  bool settled(double tolerance);
  void polish();
  bool try_step();
  Ending newton(int iterations);
  Ending by_values(ValueMethod method);
  void search_without_derivatives(Ending& ending);

  const Objective& objective_;
  const MinimiseOptions& options_;
  double size_ = 1.0;  // of the largest parameter at the start
  std::vector<double> x_;
  Evaluation at_;
  std::vector<double> hessian_;        // by columns
  std::vector<double> approximation_;  // at x_; empty where there is none
  std::vector<double> correction_;     // what updates have added to it
  std::vector<double> scale_;
  double radius_ = 0.0;
  bool fresh_ = false;  // whether the Hessian is from differences at x_, or next to it
  bool here_ = false;   // whether x_ was evaluated last
  int rejected_ = 0;    // trial steps in a row
  int misjudged_ = 0;   // steps that the Hessian at hand did not foresee
  bool stopped_ = false;
  std::string name_ = "trust-region Newton";
  std::vector<Iteration> iterations_;
  std::int64_t evaluations_ = 0;
};

}  // namespace sm::mixed
