#include <cmath>

#include "mixed/effects.hpp"
#include "mixed/factor_algebra.hpp"

namespace sm::mixed {
namespace {

std::size_t at(std::int64_t i) { return static_cast<std::size_t>(i); }

// sqrt(variance * diagonal of F inverse F') for the blocks of the levels, to `place` of each coefficient.
void set_deviations(Equations& equations, const Constraint& constraint, const std::vector<Dense>& factors,
                    double variance, std::vector<double> RandomEffects::*place, std::vector<RandomEffects*>& effects,
                    const std::vector<std::size_t>& first_effect, const Gram& gram) {
  const std::size_t terms = factors.size();
  equations.visit_inverse(constraint, [&](const Block& block, std::span<const double> inverse) {
    if (!block.diagonal() || block.t >= terms) return;
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
                 effects, first_effect, likelihood.gram());
  likelihood.equations().forget_inverse();
  if (likelihood.factor_random(optimum.factors)) {
    set_deviations(likelihood.random_equations(), likelihood.random_constraint(), factors, optimum.variance,
                   &RandomEffects::cond_sd, effects, first_effect, likelihood.gram());
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
