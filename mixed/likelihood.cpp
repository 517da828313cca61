#include "mixed/likelihood.hpp"

#include <cmath>
#include <numbers>

namespace sm::mixed {
namespace {

std::size_t at(std::int64_t i) { return static_cast<std::size_t>(i); }

}  // namespace

Likelihood::Likelihood(Module& module, const ScaledDesign& design, bool reml)
    : module_(module),
      design_(design),
      gram_(design),
      reml_(reml),
      degrees_(static_cast<double>(design.rows() - (reml ? design.model().fixed.rank() : 0))),
      all_(module, design, gram_, Part::all),
      constraint_(design) {
  constants_ = -design.log_weights();
  for (const DesignTerm& term : design.terms()) {
    if (term.precision) constants_ -= static_cast<double>(term.k) * term.precision->log_det;
  }
  if (reml) {
    for (const std::int64_t j : design.model().fixed.kept) {
      constants_ += 2.0 * static_cast<double>(std::log(design.basis().norm[at(j)]));
    }
  }
  std::vector<double> weighted = design.y();
  design.weigh(weighted);
  cross_product_ = design.transposed_product(weighted);
}

Equations& Likelihood::random_equations() {
  if (!random_) random_ = std::make_unique<Equations>(module_, design_, gram_, Part::random);
  return *random_;
}

CriterionParts Likelihood::evaluate(const Factors& factors, bool with_gradient) {
  ++evaluations_;
  CriterionParts parts;
  if (!all_.factor(factors)) {
    doubt_ = all_.doubt();
    return parts;
  }
  constraint_.prepare(all_);
  solve(factors);
  parts.s2 = sum_of_squares();
  if (with_gradient) parts.s2_gradient = gradient_of_squares(factors);

  Equations& determinant = reml_ ? all_ : random_equations();
  if (!reml_) {
    if (!determinant.factor(factors)) {
      doubt_ = determinant.doubt();
      return parts;
    }
    constraint_.prepare(determinant);
  }
  parts.log_det = constants_ + determinant.log_det() + constraint_.log_det();
  if (with_gradient) parts.log_det_gradient = determinant.log_det_gradient(factors, constraint_);
  parts.defined = std::isfinite(parts.log_det) && parts.s2 > 0.0;
  return parts;
}

double Likelihood::profiled(const CriterionParts& parts) const { return at_variance(parts, parts.s2 / degrees_); }

double Likelihood::at_variance(const CriterionParts& parts, double variance) const {
  return degrees_ * std::log(2.0 * std::numbers::pi * variance) + parts.log_det + parts.s2 / variance;
}

// One step of iterative refinement, with the residual of the equations taken from the observations.
void Likelihood::solve(const Factors& factors) {
  std::vector<double> right = cross_product_;
  multiply_factors_transposed(design_, factors, right);
  solution_ = all_.solve(right);
  constraint_.apply(solution_);
  for (int step = 0;; ++step) {
    std::vector<double> effects = solution_;
    multiply_factors(design_, factors, effects);
    residual_ = design_.y();
    design_.subtract_product(effects, residual_);
    if (step == 1) return;
    std::vector<double> weighted = residual_;
    design_.weigh(weighted);
    right = design_.transposed_product(weighted);
    multiply_factors_transposed(design_, factors, right);
    add_precision_product(design_, solution_, -1.0, right);
    std::vector<double> correction = all_.solve(right);
    constraint_.apply(correction);
    for (std::size_t i = 0; i < correction.size(); ++i) solution_[i] += correction[i];
  }
}

double Likelihood::sum_of_squares() const {
  long double sum = 0.0L;
  for (std::size_t i = 0; i < residual_.size(); ++i) sum += design_.weight(i) * residual_[i] * residual_[i];
  std::vector<double> product(solution_.size(), 0.0);
  add_precision_product(design_, solution_, 1.0, product);
  for (std::size_t i = 0; i < at(design_.random_count()); ++i) sum += product[i] * solution_[i];
  return static_cast<double>(sum);
}

// The solution minimizes r'Wr + b'Kb, so that only the factors' own part of the derivative is left.
Factors Likelihood::gradient_of_squares(const Factors& factors) {
  std::vector<double> weighted = residual_;
  design_.weigh(weighted);
  const std::vector<double> score = design_.transposed_product(weighted);
  Factors gradient;
  for (std::size_t t = 0; t < factors.size(); ++t) {
    const DesignTerm& term = design_.terms()[t];
    const auto k = at(term.k);
    std::vector<double> sum(k * k, 0.0);
    for (std::int64_t l = 0; l < term.levels; ++l) {
      const std::size_t first = at(term.first + l * term.k);
      for (std::size_t b = 0; b < k; ++b) {
        for (std::size_t a = 0; a < k; ++a) sum[b * k + a] -= 2.0 * score[first + a] * solution_[first + b];
      }
    }
    gradient.push_back(std::move(sum));
  }
  return gradient;
}

}  // namespace sm::mixed
