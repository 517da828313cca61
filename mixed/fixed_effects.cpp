#include <fmt/core.h>

#include <algorithm>
#include <cmath>

#include "mixed/effects.hpp"
#include "mixed/factor_algebra.hpp"

namespace sm::mixed {
namespace {

std::size_t at(std::int64_t i) { return static_cast<std::size_t>(i); }

constexpr double kLeastDf = 0.005;  // what would be printed as 0.00 is none

struct Estimate {
  double value = 0.0;
  double se = 0.0;
  std::optional<double> df;
  std::vector<double> covariance;  // with each coefficient of X; empty unless asked for
};

// Linear functions l of the fixed effects, several at a time through the factor. With q = C^- (0, l~) the variance is
// l~'q, relative to the residual variance, and its derivative by a factor -2 sum g q', g = G T q: the solution q
// minimizes a form whose minimum is the variance.
class LinearFunctions {
 public:
  LinearFunctions(Likelihood& likelihood, const AtOptimum& optimum)
      : likelihood_(likelihood), design_(likelihood.design()), optimum_(optimum) {}

  // `functions`: over all columns of X, zero for aliased ones.
  std::vector<Estimate> estimate(const std::vector<std::vector<double>>& functions, bool with_covariance) {
    const std::size_t order = at(design_.unknowns());
    const std::size_t random = at(design_.random_count());
    std::vector<double> right(order * functions.size(), 0.0);
    for (std::size_t f = 0; f < functions.size(); ++f) {
      const std::vector<double> transformed = design_.basis().solve_transposed(functions[f]);
      std::copy(transformed.begin(), transformed.end(),
                right.begin() + static_cast<std::ptrdiff_t>(f * order + random));
    }
    std::vector<double> moved = right;
    likelihood_.constraint().apply_transposed(moved);
    std::vector<double> solved = likelihood_.equations().solve(moved, static_cast<std::int64_t>(functions.size()));
    likelihood_.constraint().apply(solved);
    std::vector<Estimate> estimates;
    for (std::size_t f = 0; f < functions.size(); ++f) {
      const std::span<const double> q(&solved[f * order], order);
      const std::span<const double> l(&right[f * order], order);
      Estimate estimate;
      double variance = 0.0;
      long double value = 0.0L;
      for (std::size_t j = random; j < order; ++j) {
        variance += l[j] * q[j];
        value += static_cast<long double>(l[j]) * (design_.offset()[j - random] + likelihood_.solution()[j]);
      }
      estimate.value = static_cast<double>(value);
      estimate.se = std::sqrt(optimum_.variance * variance);
      estimate.df = degrees_of_freedom(q, variance);
      if (with_covariance) {
        estimate.covariance = design_.basis().solve(q.subspan(random));
        for (double& element : estimate.covariance) element *= optimum_.variance;
      }
      estimates.push_back(std::move(estimate));
    }
    return estimates;
  }

  // Whether degrees of freedom were left out because the data hardly determine a variance.
  bool undetermined() const { return undetermined_; }

 private:
  // Satterthwaite (1946): 2 v^2 / Var(v), v and the parameters relative to the residual variance.
  std::optional<double> degrees_of_freedom(std::span<const double> q, double variance) {
    if (!optimum_.covariance.known() || !(variance > 0.0)) return std::nullopt;
    std::vector<double> effects(q.begin(), q.end());
    multiply_factors(design_, optimum_.factors, effects);
    std::vector<double> product(q.size(), 0.0);
    likelihood_.gram().add_product(effects, product);
    Factors derivative;
    for (const DesignTerm& term : design_.terms()) {
      const auto k = at(term.k);
      Dense sum(k * k, 0.0);
      for (std::int64_t l = 0; l < term.levels; ++l) {
        const std::size_t first = at(term.first + l * term.k);
        for (std::size_t b = 0; b < k; ++b) {
          for (std::size_t a = 0; a < k; ++a) sum[b * k + a] -= 2.0 * product[first + a] * q[first + b];
        }
      }
      derivative.push_back(std::move(sum));
    }
    std::vector<double> gradient = optimum_.parameters.gradient(derivative);
    gradient.push_back(variance);  // by the logarithm of the residual variance
    // A variance smaller by orders of magnitude than its derivatives would overflow on the way.
    for (double& element : gradient) element /= variance;
    const double df = 2.0 / congruence(gradient, optimum_.covariance.covariance, 1, gradient.size())[0];
    if (df >= kLeastDf) return df;
    undetermined_ = true;
    return std::nullopt;
  }

  Likelihood& likelihood_;
  const ScaledDesign& design_;
  const AtOptimum& optimum_;
  bool undetermined_ = false;
};

// Where the criterion hardly changes with a variance, standard errors that depend on it are hardly known either.
void say_undetermined(const LinearFunctions& functions, Fit& fit) {
  if (!functions.undetermined()) return;
  const auto doubt = [](const VarianceComponent& c) {
    return c.se_observed && c.vcov != 0.0 && c.var2.empty() ? *c.se_observed / std::abs(c.vcov) : 0.0;
  };
  const auto worst = std::max_element(fit.varcomp.begin(), fit.varcomp.end(),
                                      [&](const auto& a, const auto& b) { return doubt(a) < doubt(b); });
  std::string text = "degrees of freedom are not available (—) where the data hardly determine a standard error";
  if (worst != fit.varcomp.end() && doubt(*worst) > 1.0) {
    text += fmt::format(": it depends on the variance of '{}'{}, whose own standard error is {:.2g} times as large",
                        worst->group, worst->var1.empty() ? "" : fmt::format(" ({})", worst->var1), doubt(*worst));
  }
  if (std::find(fit.messages.begin(), fit.messages.end(), text) == fit.messages.end()) fit.messages.push_back(text);
}

constexpr std::size_t kTogether = 8;

std::string dependence_text(const FixedDesign& fixed, std::size_t aliased) {
  std::string text;
  const std::size_t rank = fixed.kept.size();
  for (std::size_t j = 0; j < rank; ++j) {
    const double factor = fixed.dependence[aliased * rank + j];
    if (factor == 0.0) continue;
    const std::string& name = fixed.names[at(fixed.kept[j])];
    const std::string size = std::abs(factor) == 1.0 ? name : fmt::format("{:.6g}*{}", std::abs(factor), name);
    if (text.empty()) {
      text = factor < 0.0 ? "-" + size : size;
    } else {
      text += (factor < 0.0 ? " - " : " + ") + size;
    }
  }
  return fmt::format("{} = {}", fixed.names[at(fixed.aliased[aliased])], text.empty() ? "0" : text);
}

void set_tests(const Estimate& estimate, FixedEffect& effect) {
  effect.estimate = estimate.value;
  effect.se = estimate.se;
  effect.df = estimate.df;
  effect.t = estimate.value / estimate.se;
}

// With too many columns for a solve each: variances from the inverse on the pattern of the equations, but for those
// that other columns were made orthogonal to.
void set_many(Likelihood& likelihood, const AtOptimum& optimum, Fit& fit) {
  const ScaledDesign& design = likelihood.design();
  const std::size_t random = at(design.random_count());
  std::vector<double> all(likelihood.solution().begin() + static_cast<std::ptrdiff_t>(random),
                          likelihood.solution().end());
  for (std::size_t j = 0; j < all.size(); ++j) all[j] += design.offset()[j];
  const std::vector<double> beta = design.basis().solve(all);
  std::vector<double> variance(all.size(), 0.0);
  likelihood.equations().visit_inverse(likelihood.constraint(),
                                       [&](const Block& block, std::span<const double> inverse) {
                                         if (block.diagonal() && block.row >= random)
                                           variance[block.row - random] = inverse[0];
                                       });
  std::vector<bool> involved(all.size(), false);
  for (const auto& above : design.basis().above) {
    for (const FixedBasis::Part& part : above) involved[at(part.column)] = true;
  }
  AtOptimum without{optimum.parameters, optimum.factors, optimum.variance, {}};
  LinearFunctions functions(likelihood, without);
  for (const std::int64_t j : design.model().fixed.kept) {
    Estimate estimate{.value = beta[at(j)], .se = 0.0, .df = std::nullopt, .covariance = {}};
    if (involved[at(j)]) {
      std::vector<double> unit(all.size(), 0.0);
      unit[at(j)] = 1.0;
      estimate = functions.estimate({unit}, false).front();
    } else {
      const auto norm = static_cast<double>(design.basis().norm[at(j)]);
      estimate.se = std::sqrt(optimum.variance * variance[at(j)]) / norm;
    }
    set_tests(estimate, fit.fixef[at(j)]);
  }
}

}  // namespace

void set_fixed_effects(Likelihood& likelihood, const AtOptimum& optimum, std::int64_t max_vcov, Fit& fit) {
  const FixedDesign& fixed = likelihood.design().model().fixed;
  for (const std::string& name : fixed.names) {
    FixedEffect effect;
    effect.name = name;
    fit.fixef.push_back(std::move(effect));
  }
  for (std::size_t a = 0; a < fixed.aliased.size(); ++a) {
    FixedEffect& effect = fit.fixef[at(fixed.aliased[a])];
    effect.aliased = true;
    effect.dependence = dependence_text(fixed, a);
  }
  if (fixed.rank() > max_vcov) {
    set_many(likelihood, optimum, fit);
    return;
  }
  LinearFunctions functions(likelihood, optimum);
  for (std::size_t first = 0; first < fixed.kept.size(); first += kTogether) {
    std::vector<std::vector<double>> units;
    for (std::size_t j = first; j < std::min(first + kTogether, fixed.kept.size()); ++j) {
      units.emplace_back(fixed.names.size(), 0.0);
      units.back()[at(fixed.kept[j])] = 1.0;
    }
    const std::vector<Estimate> estimates = functions.estimate(units, true);
    for (std::size_t f = 0; f < estimates.size(); ++f) {
      set_tests(estimates[f], fit.fixef[at(fixed.kept[first + f])]);
      for (const std::int64_t j : fixed.kept) fit.vcov_fixef.push_back(estimates[f].covariance[at(j)]);
    }
  }
  say_undetermined(functions, fit);
}

namespace {

// A function of aliased columns is that of the columns that they depend on, or nothing can be said about it.
std::string why_not_estimable(const FixedDesign& fixed, const std::vector<double>& l) {
  constexpr double kRounding = 1e-8;
  std::string needed;
  for (std::size_t a = 0; a < fixed.aliased.size(); ++a) {
    double wanted = 0.0;
    double size = std::abs(l[at(fixed.aliased[a])]);
    for (std::size_t j = 0; j < fixed.kept.size(); ++j) {
      const double part = fixed.dependence[a * fixed.kept.size() + j] * l[at(fixed.kept[j])];
      wanted += part;
      size += std::abs(part);
    }
    if (std::abs(l[at(fixed.aliased[a])] - wanted) <= kRounding * size) continue;
    needed += (needed.empty() ? "" : ", ") + fixed.names[at(fixed.aliased[a])];
  }
  return needed.empty() ? "" : "depends on the separate effect of " + needed + ", which the data do not determine";
}

}  // namespace

void set_contrasts(Likelihood& likelihood, const AtOptimum& optimum, const std::vector<ContrastRequest>& requests,
                   Fit& fit) {
  const FixedDesign& fixed = likelihood.design().model().fixed;
  LinearFunctions functions(likelihood, optimum);
  for (const ContrastRequest& request : requests) {
    Contrast contrast;
    contrast.name = request.name;
    contrast.l = request.l;
    contrast.reason = why_not_estimable(fixed, request.l);
    contrast.estimable = contrast.reason.empty();
    if (contrast.estimable) {
      std::vector<double> kept(request.l.size(), 0.0);
      for (const std::int64_t j : fixed.kept) kept[at(j)] = request.l[at(j)];
      const Estimate estimate = functions.estimate({kept}, false).front();
      contrast.estimate = estimate.value;
      contrast.se = estimate.se;
      contrast.df = estimate.df;
      contrast.t = estimate.value / estimate.se;
    }
    fit.contrasts.push_back(std::move(contrast));
  }
  say_undetermined(functions, fit);
}

}  // namespace sm::mixed
