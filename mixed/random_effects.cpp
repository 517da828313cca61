#include <cmath>
#include <numeric>

#include "mixed/effects.hpp"
#include "mixed/factor_algebra.hpp"

namespace sm::mixed {
namespace {

std::size_t at(std::int64_t i) { return static_cast<std::size_t>(i); }

// What the uncertainty of the fixed effects adds to the covariance of the random effects, Q S Q' with S^-1 the
// covariance of the fixed effects and Q the columns of C^- that belong to them.
class FixedShare {
 public:
  // Not known where Q would be large, or where what it is taken from is not at hand.
  explicit FixedShare(Likelihood& likelihood) {
    const std::vector<std::int64_t>& kept = likelihood.design().model().fixed.kept;
    if (!likelihood.reml() || kept.empty() || kept.size() > kMost / at(likelihood.design().unknowns()) ||
        !likelihood.constraint().empty())
      return;
    rank_ = kept.size();
    order_ = at(likelihood.design().unknowns());
    const std::size_t random = at(likelihood.design().random_count());
    std::vector<double> unit(order_ * rank_, 0.0);
    for (std::size_t j = 0; j < rank_; ++j) unit[j * order_ + random + at(kept[j])] = 1.0;
    columns_ = likelihood.equations().solve(unit, static_cast<std::int64_t>(rank_));
    Dense covariance;
    for (std::size_t j = 0; j < rank_; ++j) {
      for (const std::int64_t i : kept) covariance.push_back(columns_[j * order_ + random + at(i)]);
    }
    if (std::optional<Dense> lower = cholesky_factor(covariance, rank_)) lower_ = std::move(*lower);
  }
  // Not where next to nothing was left of a block that it was taken from.
  bool known() const { return !lower_.empty() && !cancelled_; }

  // Takes it from the block of the unknowns from `first` on.
  void take_from(std::size_t first, std::size_t k, std::vector<double>& block) {
    rows_.resize(k * rank_);
    for (std::size_t a = 0; a < k; ++a) {
      double* const row = &rows_[a * rank_];
      for (std::size_t j = 0; j < rank_; ++j) {
        double sum = columns_[j * order_ + first + a];
        for (std::size_t i = 0; i < j; ++i) sum -= lower_[i * rank_ + j] * row[i];
        row[j] = sum / lower_[j * rank_ + j];
      }
      for (std::size_t b = 0; b <= a; ++b) {
        const double share = std::inner_product(row, row + rank_, &rows_[b * rank_], 0.0);
        if (a == b && share > kAlmostAll * block[a * k + a]) cancelled_ = true;
        block[a * k + b] -= share;
        if (a != b) block[b * k + a] -= share;
      }
    }
  }

 private:
  static constexpr std::size_t kMost = 4000000;  // elements
  static constexpr double kAlmostAll = 1.0 - 1e-6;

  std::size_t rank_ = 0;
  std::size_t order_ = 0;
  std::vector<double> columns_;  // Q and, behind it, the covariance of the fixed effects
  Dense lower_;                  // its Cholesky factor
  bool cancelled_ = false;
  std::vector<double> rows_;
};

// sqrt(variance * diagonal of F inverse F') for the blocks of the levels, to `place` of each coefficient; less the share
// of the fixed effects, if one is given.
void set_deviations(Equations& equations, const Constraint& constraint, const std::vector<Dense>& factors,
                    double variance, std::vector<double> RandomEffects::*place, std::vector<RandomEffects*>& effects,
                    const std::vector<std::size_t>& first_effect, const Gram& gram, FixedShare* share) {
  const std::size_t terms = factors.size();
  std::vector<double> inverse;
  equations.visit_inverse(constraint, [&](const Block& block, std::span<const double> whole) {
    if (!block.diagonal() || block.t >= terms) return;
    inverse.assign(whole.begin(), whole.end());
    if (share) share->take_from(block.row, block.k, inverse);
    const Dense& factor = factors[block.t];
    const std::size_t level = at(block.node - gram.first_node(block.t));
    for (std::size_t c = 0; c < block.k; ++c) {
      double sum = 0.0;
      for (std::size_t a = 0; a < block.k; ++a) {
        for (std::size_t b = 0; b < block.k; ++b) {
          sum += factor[a * block.k + c] * inverse[a * block.k + b] * factor[b * block.k + c];
        }
      }
      (effects[first_effect[block.t] + c]->*place)[level] = std::sqrt(std::max(0.0, variance * sum));
    }
  });
}

}  // namespace

void set_random_effects(Likelihood& likelihood, const AtOptimum& optimum, Fit& fit) {
  const ScaledDesign& design = likelihood.design();
  std::vector<Dense> factors;
  std::vector<std::size_t> first_effect;
  for (std::size_t t = 0; t < design.terms().size(); ++t) {
    const RandomTerm& term = design.model().random[t];
    const auto k = at(term.coef_count());
    const auto levels = at(term.level_count());
    factors.push_back(model_factor(design, optimum.factors, t));
    first_effect.push_back(fit.ranef.size());
    for (std::size_t c = 0; c < k; ++c) {
      RandomEffects effects;
      effects.group = term.group;
      effects.term = term.coefs[c];
      effects.levels = term.levels;
      effects.estimate.resize(levels);
      for (std::size_t l = 0; l < levels; ++l) {
        const std::size_t first = at(design.terms()[t].first) + l * k;
        for (std::size_t a = 0; a < k; ++a)
          effects.estimate[l] += factors[t][a * k + c] * likelihood.solution()[first + a];
      }
      effects.cond_sd.assign(levels, 0.0);
      effects.pev_sd.assign(levels, 0.0);
      fit.ranef.push_back(std::move(effects));
    }
  }
  std::vector<RandomEffects*> effects;
  for (RandomEffects& one : fit.ranef) effects.push_back(&one);
  set_deviations(likelihood.equations(), likelihood.constraint(), factors, optimum.variance, &RandomEffects::pev_sd,
                 effects, first_effect, likelihood.gram(), nullptr);
  FixedShare share(likelihood);
  if (share.known()) {
    set_deviations(likelihood.equations(), likelihood.constraint(), factors, optimum.variance, &RandomEffects::cond_sd,
                   effects, first_effect, likelihood.gram(), &share);
  }
  likelihood.equations().forget_inverse();
  if (!share.known() && likelihood.factor_random(optimum.factors)) {
    set_deviations(likelihood.random_equations(), likelihood.random_constraint(), factors, optimum.variance,
                   &RandomEffects::cond_sd, effects, first_effect, likelihood.gram(), nullptr);
    likelihood.random_equations().forget_inverse();
  }
  for (std::size_t t = 0; t < design.terms().size(); ++t) {
    const Precision* const precision = design.terms()[t].precision;
    if (!precision || precision->inverse_diagonal_excess.empty()) continue;
    const auto k = at(design.terms()[t].k);
    const Dense covariance = multiplied_transposed(factors[t], factors[t], k);
    for (std::size_t c = 0; c < k; ++c) {
      RandomEffects& one = fit.ranef[first_effect[t] + c];
      for (std::size_t l = 0; l < one.pev_sd.size(); ++l) {
        const double prior = optimum.variance * covariance[c * k + c] * (1.0 + precision->inverse_diagonal_excess[l]);
        one.reliability.push_back(prior > 0.0 ? 1.0 - one.pev_sd[l] * one.pev_sd[l] / prior : 0.0);
      }
    }
  }
}

}  // namespace sm::mixed
