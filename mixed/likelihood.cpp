#include "mixed/likelihood.hpp"

#include <cmath>
#include <numbers>
#include <utility>

namespace sm::mixed {
namespace {

std::size_t at(std::int64_t i) { return static_cast<std::size_t>(i); }

}  // namespace

Likelihood::Likelihood(Module& module, const ScaledDesign& design, bool reml)
    : design_(design),
      gram_(design),
      reml_(reml),
      degrees_(static_cast<double>(design.rows() - (reml ? design.model().fixed.rank() : 0))),
      all_(module, design, gram_, Part::all),
      null_space_(design, all_, Part::all),
      random_null_space_(design, all_, Part::random),
      constraint_(design),
      random_constraint_(design) {
  constants_ = -design.log_weights();
  for (const DesignTerm& term : design.terms()) {
    if (term.precision) constants_ -= static_cast<double>(term.k) * term.precision->log_det;
  }
  if (reml) {
    for (const std::int64_t j : design.model().fixed.kept) {
      constants_ += 2.0 * static_cast<double>(std::log(design.basis().norm[at(j)]));
    }
  }
}

bool Likelihood::factor_random(const Factors& factors) {
  if (!random_) random_ = std::make_unique<Equations>(all_, Part::random);
  if (!random_->factor(factors, random_null_space_.superfluous(factors))) {
    doubt_ = random_->doubt();
    return false;
  }
  random_constraint_.prepare(*random_);
  return true;
}

CriterionParts Likelihood::evaluate(const Factors& factors, bool with_gradient) {
  if (!last_.defined || factors != last_factors_) {
    last_ = {};
    last_factors_ = factors;
    last_ = value(factors);
  }
  if (!last_.defined || !with_gradient || last_.s2_gradient.size() == factors.size()) return last_;
  Factors squares = gradient_of_squares(factors);
  last_.log_det_gradient =
      reml_ ? all_.log_det_gradient(factors, constraint_) : random_->log_det_gradient(factors, random_constraint_);
  last_.s2_gradient = std::move(squares);  // last: it tells that both are there
  return last_;
}

CriterionParts Likelihood::value(const Factors& factors) {
  ++evaluations_;
  CriterionParts parts;
  if (!all_.factor(factors, null_space_.superfluous(factors))) {
    doubt_ = all_.doubt();
    return parts;
  }
  constraint_.prepare(all_);
  solved_ = solve_response(design_.y(), factors, 1);
  parts.s2 = sum_of_squares();
  if (!reml_ && !factor_random(factors)) return parts;
  parts.log_det =
      constants_ + (reml_ ? all_.log_det() + constraint_.log_det() : random_->log_det() + random_constraint_.log_det());
  parts.defined = std::isfinite(parts.log_det) && parts.s2 > 0.0;
  return parts;
}

double Likelihood::profiled(const CriterionParts& parts) const { return at_variance(parts, parts.s2 / degrees_); }

Factors Likelihood::profiled_gradient(const CriterionParts& parts) const {
  Factors gradient = parts.log_det_gradient;
  for (std::size_t t = 0; t < gradient.size(); ++t) {
    for (std::size_t i = 0; i < gradient[t].size(); ++i) {
      gradient[t][i] += degrees_ / parts.s2 * parts.s2_gradient[t][i];
    }
  }
  return gradient;
}

double Likelihood::at_variance(const CriterionParts& parts, double variance) const {
  return degrees_ * std::log(2.0 * std::numbers::pi * variance) + parts.log_det + parts.s2 / variance;
}

// The residual of the equations is taken from the observations.
Likelihood::Solution Likelihood::solve_response(std::span<const double> response, const Factors& factors,
                                                int refinements) {
  Solution solution;
  solution.unknowns.assign(at(design_.unknowns()), 0.0);
  solution.residual.assign(response.begin(), response.end());
  for (int step = 0; step <= refinements; ++step) {
    std::vector<double> weighted = solution.residual;
    design_.weigh(weighted);
    std::vector<double> right = design_.transposed_product(weighted);
    multiply_factors_transposed(design_, factors, right);
    add_precision_product(design_, solution.unknowns, -1.0, right);
    std::vector<double> correction = all_.solve(right);
    constraint_.apply(correction);
    for (std::size_t i = 0; i < correction.size(); ++i) solution.unknowns[i] += correction[i];
    std::vector<double> effects = solution.unknowns;
    multiply_factors(design_, factors, effects);
    solution.residual.assign(response.begin(), response.end());
    design_.subtract_product(effects, solution.residual);
  }
  return solution;
}

double Likelihood::sum_of_squares() const {
  // In sums that do not wait for each other.
  constexpr std::size_t kSums = 4;
  long double sums[kSums] = {};
  for (std::size_t i = 0; i < solved_.residual.size(); ++i)
    sums[i % kSums] += design_.weight(i) * solved_.residual[i] * solved_.residual[i];
  std::vector<double> product(solved_.unknowns.size(), 0.0);
  add_precision_product(design_, solved_.unknowns, 1.0, product);
  for (std::size_t i = 0; i < at(design_.random_count()); ++i) sums[i % kSums] += product[i] * solved_.unknowns[i];
  return static_cast<double>(sums[0] + sums[1] + (sums[2] + sums[3]));
}

// The solution minimizes r'Wr + b'Kb, so that only the factors' own part of the derivative is left.
Factors Likelihood::gradient_of_squares(const Factors& factors) {
  std::vector<double> weighted = solved_.residual;
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
        for (std::size_t a = 0; a < k; ++a) sum[b * k + a] -= 2.0 * score[first + a] * solved_.unknowns[first + b];
      }
    }
    gradient.push_back(std::move(sum));
  }
  return gradient;
}

}  // namespace sm::mixed
