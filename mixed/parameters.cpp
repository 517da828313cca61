#include "mixed/parameters.hpp"

#include <cmath>

namespace sm::mixed {
std::size_t Parameters::order_of(const Dense& factor) {
  return static_cast<std::size_t>(std::lround(std::sqrt(static_cast<double>(factor.size()))));
}

Parameters::Parameters(const Factors& factors) : Parameters(factors, std::vector<double>(factors.size(), 0.0)) {}

Parameters::Parameters(const Factors& factors, std::span<const double> limits) {
  for (std::size_t t = 0; t < factors.size(); ++t) {
    const std::size_t n = order_of(factors[t]);
    ReducedFactor part{.factor = lower_factor(factors[t], n), .rank = n, .rows = {}};
    for (std::size_t i = 0; i < n; ++i) part.rows.push_back(i);
    if (limits[t] > 0.0 && singular_values(factors[t], n).back() < limits[t]) part = reduced(factors[t], n, limits[t]);
    for (std::size_t c = 0; c < part.rank; ++c) {
      for (std::size_t i = c; i < n; ++i) places_.push_back({t, part.rows[i], c});
    }
    start_.push_back(std::move(part.factor));
    order_.push_back(n);
    rank_.push_back(part.rank);
  }
}

std::vector<double> Parameters::values() const {
  std::vector<double> values;
  for (const Place& place : places_) values.push_back(start_[place.term][place.col * order_[place.term] + place.row]);
  return values;
}

Factors Parameters::factors(std::span<const double> values) const {
  Factors factors;
  for (const std::size_t n : order_) factors.emplace_back(n * n, 0.0);
  for (std::size_t i = 0; i < values.size(); ++i) {
    const Place& place = places_[i];
    factors[place.term][place.col * order_[place.term] + place.row] = values[i];
  }
  return factors;
}

std::vector<double> Parameters::gradient(const Factors& by_element) const {
  std::vector<double> gradient;
  for (const Place& place : places_)
    gradient.push_back(by_element[place.term][place.col * order_[place.term] + place.row]);
  return gradient;
}

bool Parameters::full() const {
  for (std::size_t t = 0; t < order_.size(); ++t) {
    if (!full(t)) return false;
  }
  return true;
}

}  // namespace sm::mixed
