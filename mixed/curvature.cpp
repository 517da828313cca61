#include "mixed/curvature.hpp"

#include <algorithm>
#include <cmath>

#include "mixed/vectors.hpp"

namespace sm::mixed {
namespace {

std::size_t at(std::int64_t i) { return static_cast<std::size_t>(i); }

constexpr double kSingular = 1e-4;  // a factor's smallest diagonal element over its largest element

bool is_regular(const Dense& factor, std::size_t k) {
  double largest = 0.0;
  for (const double element : factor) largest = std::max(largest, std::abs(element));
  for (std::size_t c = 0; c < k; ++c) {
    if (!(std::abs(factor[c * k + c]) > kSingular * std::max(largest, 1.0))) return false;
  }
  return true;
}

// With a = K^- Z'Py, T'a = b: the derivative of Z T K^- T'Z' by element (r, c) of T, times Py, is Z e with
// e = a_r T_c + (T'a)_c i_r for each level, T_c a column of T and i_r one of the identity.
class Directions {
 public:
  Directions(Likelihood& likelihood, const Parameters& parameters, const Factors& factors)
      : likelihood_(likelihood), design_(likelihood.design()), factors_(factors), order_(at(design_.unknowns())) {
    for (std::size_t t = 0; t < factors.size(); ++t) inverses_.push_back(inverse_of(factors[t], parameters.order(t)));
    for (const Parameters::Place& place : parameters.places()) add(place);
    solved_ = right_;
    for (std::size_t j = 0; j < count(); ++j) likelihood_.constraint().apply_transposed(part(solved_, j));
    solved_ = likelihood_.equations().solve(solved_, static_cast<std::int64_t>(count()));
    likelihood_.constraint().apply(solved_);
  }

  // (Z e_i)' P (Z e_j)
  double product(std::size_t i, std::size_t j) {
    return dot(part(effects_, i), part(products_, j)) - dot(part(right_, i), part(solved_, j));
  }

 private:
  std::size_t count() const { return effects_.size() / order_; }
  std::span<double> part(std::vector<double>& all, std::size_t j) const { return {&all[j * order_], order_}; }

  void add(const Parameters::Place& place) {
    const DesignTerm& term = design_.terms()[place.term];
    const auto k = at(term.k);
    const double* const column = &factors_[place.term][place.col * k];
    const double* const inverse = &inverses_[place.term][place.row * k];
    const std::vector<double>& solution = likelihood_.solution();
    effects_.resize(effects_.size() + order_, 0.0);
    double* const effects = &effects_[effects_.size() - order_];
    for (std::int64_t l = 0; l < term.levels; ++l) {
      const std::size_t first = at(term.first + l * term.k);
      double a = 0.0;
      for (std::size_t c = 0; c < k; ++c) a += inverse[c] * solution[first + c];
      for (std::size_t c = place.col; c < k; ++c) effects[first + c] = a * column[c];
      effects[first + place.row] += solution[first + place.col];
    }
    products_.resize(effects_.size(), 0.0);
    likelihood_.gram().add_product(part(effects_, count() - 1), part(products_, count() - 1));
    const std::span<double> product = part(products_, count() - 1);
    right_.insert(right_.end(), product.begin(), product.end());
    multiply_factors_transposed(design_, factors_, part(right_, count() - 1));
  }

  Likelihood& likelihood_;
  const ScaledDesign& design_;
  const Factors& factors_;
  std::size_t order_;
  std::vector<Dense> inverses_;
  std::vector<double> effects_;   // e for each parameter
  std::vector<double> products_;  // G e
  std::vector<double> right_;     // T'G e
  std::vector<double> solved_;    // C^- T'G e
};

// The gradient by the covariance matrix T T' of a term, symmetric: that by T is twice its product with T.
std::vector<Dense> gradients_by_covariance(const Likelihood& likelihood, const Parameters& parameters,
                                           const Factors& factors, const CriterionParts& parts) {
  std::vector<Dense> result = likelihood.profiled_gradient(parts);
  for (std::size_t t = 0; t < factors.size(); ++t) {
    const std::size_t k = parameters.order(t);
    const Dense half = multiplied(result[t], inverse_of(factors[t], k), k);
    for (std::size_t b = 0; b < k; ++b) {
      for (std::size_t a = 0; a < k; ++a) result[t][b * k + a] = 0.25 * (half[b * k + a] + half[a * k + b]);
    }
  }
  return result;
}

}  // namespace

std::vector<double> average_curvature(Likelihood& likelihood, const Parameters& parameters, const Factors& factors,
                                      const CriterionParts& parts) {
  for (std::size_t t = 0; t < factors.size(); ++t) {
    if (!parameters.full(t) || !is_regular(factors[t], parameters.order(t))) return {};
  }
  const std::size_t m = parameters.count();
  const double variance = parts.s2 / likelihood.degrees();
  Directions directions(likelihood, parameters, factors);
  const std::vector<Dense> by_covariance = gradients_by_covariance(likelihood, parameters, factors, parts);
  const std::vector<double> slope = parameters.gradient(parts.s2_gradient);
  std::vector<double> curvature(m * m);
  for (std::size_t j = 0; j < m; ++j) {
    for (std::size_t i = j; i < m; ++i) {
      double value = (directions.product(i, j) - slope[i] * slope[j] / parts.s2) / variance;
      const Parameters::Place& p = parameters.places()[i];
      const Parameters::Place& q = parameters.places()[j];
      // T T' has second derivatives of its own.
      if (p.term == q.term && p.col == q.col) {
        value += 2.0 * by_covariance[p.term][q.row * parameters.order(p.term) + p.row];
      }
      curvature[j * m + i] = curvature[i * m + j] = value;
    }
  }
  return curvature;
}

}  // namespace sm::mixed
