// The free elements of relative covariance factors as a vector of parameters.
#pragma once

#include <span>

#include "mixed/factor_algebra.hpp"
#include "mixed/scaled_design.hpp"

namespace sm::mixed {

class Parameters {
 public:
  // Lower triangles.
  explicit Parameters(const Factors& factors);
  // Lower triangles after singular values below the limits, one for each term, are taken for zeros.
  Parameters(const Factors& factors, std::span<const double> limits);

  static std::size_t order_of(const Dense& factor);

  std::size_t count() const { return places_.size(); }
  std::vector<double> values() const;
  Factors factors(std::span<const double> values) const;
  std::vector<double> gradient(const Factors& by_element) const;

  std::size_t rank(std::size_t term) const { return rank_[term]; }
  std::size_t order(std::size_t term) const { return order_[term]; }
  bool full(std::size_t term) const { return rank_[term] == order_[term]; }
  bool full() const;

  // Which element of which factor a parameter is.
  struct Place {
    std::size_t term;
    std::size_t row;
    std::size_t col;
  };
  const std::vector<Place>& places() const { return places_; }

 private:
  Factors start_;
  std::vector<std::size_t> order_;
  std::vector<std::size_t> rank_;
  std::vector<Place> places_;
};

}  // namespace sm::mixed
