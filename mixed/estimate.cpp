#include "mixed/estimate.hpp"

#include <fmt/core.h>

#include <chrono>
#include <cmath>
#include <numeric>

#include "mixed/effects.hpp"
#include "mixed/error.hpp"
#include "mixed/factor_algebra.hpp"
#include "mixed/optimum.hpp"
#include "mixed/variances.hpp"

namespace sm::mixed {
namespace {

std::size_t at(std::int64_t i) { return static_cast<std::size_t>(i); }

void check(const Model& model, const FitOptions& options) {
  const std::int64_t degrees = model.rows() - model.fixed.rank();
  if (degrees < 1) {
    throw ModelError({.what = fmt::format("{} observations do not determine {} fixed effects and a residual variance",
                                          model.rows(), model.fixed.rank()),
                      .advice = "leave terms out of the fixed part, or use more data"});
  }
  std::size_t components = 1;
  for (const RandomTerm& term : model.random) components += at(term.coef_count() * (term.coef_count() + 1) / 2);
  if (!options.variances.empty() && options.variances.size() != components) {
    throw ModelError({.what = fmt::format("{} variances are given", options.variances.size()),
                      .expected = fmt::format("{}", components),
                      .advice = "give those of each random term, and of the residuals last"});
  }
  if (!options.start.empty() && options.start.size() + 1 != components) {
    throw ModelError({.what = fmt::format("the start has {} parameters", options.start.size()),
                      .expected = fmt::format("{}", components - 1),
                      .advice = "start from a fit of the same random terms"});
  }
}

// Lower triangles by columns, one for each term, to whole matrices.
Factors unpacked(const Model& model, const std::vector<double>& packed, bool symmetric) {
  Factors factors;
  std::size_t next = 0;
  for (const RandomTerm& term : model.random) {
    const auto k = at(term.coef_count());
    Dense factor(k * k, 0.0);
    for (std::size_t b = 0; b < k; ++b) {
      for (std::size_t a = b; a < k; ++a) {
        factor[b * k + a] = packed[next++];
        if (symmetric) factor[a * k + b] = factor[b * k + a];
      }
    }
    factors.push_back(std::move(factor));
  }
  return factors;
}

// The factors of the model in the coordinates of the scaled design.
Factors to_scaled(const ScaledDesign& design, Factors factors) {
  for (std::size_t t = 0; t < factors.size(); ++t) {
    const auto k = at(design.terms()[t].k);
    factors[t] = lower_factor(multiplied(inverse_of_triangle(design.terms()[t].basis, k), factors[t], k), k);
  }
  return factors;
}

// The variance between the levels of a term, for each of its coefficients alone, everything else taken for noise: the
// sums of squares of a one-way layout (Henderson 1953). Negative where the data have next to no second record of a level.
std::vector<double> variances_between(const ScaledDesign& design, const DesignTerm& term, double total) {
  const auto k = at(term.k);
  std::vector<double> square(at(term.levels) * k, 0.0);
  std::vector<double> product(square.size(), 0.0);
  for (std::size_t i = 0; i < at(design.rows()); ++i) {
    for (std::size_t c = 0; c < k; ++c) {
      const double z = term.z[i * k + c];
      square[at((*term.level)[i]) * k + c] += design.weight(i) * z * z;
      product[at((*term.level)[i]) * k + c] += design.weight(i) * z * design.y()[i];
    }
  }
  std::vector<double> variances;
  for (std::size_t c = 0; c < k; ++c) {
    double between = 0.0;
    double levels = 0.0;
    for (std::size_t l = c; l < square.size(); l += k) {
      if (square[l] <= 0.0) continue;
      between += product[l] * product[l] / square[l];
      levels += 1.0;
    }
    const double beyond = static_cast<double>(design.rows()) - levels;
    variances.push_back(beyond > 0.1 * levels ? (between - levels * total) / beyond : -1.0);
  }
  return variances;
}

// Where nothing better is known the search begins with variances like that of the residuals.
Factors moment_factors(const ScaledDesign& design) {
  double total = 0.0;
  for (std::size_t i = 0; i < at(design.rows()); ++i) total += design.weight(i) * design.y()[i] * design.y()[i];
  total /= static_cast<double>(design.rows());
  std::vector<std::vector<double>> variances;
  double residual = total;
  for (const DesignTerm& term : design.terms()) {
    variances.push_back(variances_between(design, term, total));
    for (const double variance : variances.back()) residual -= std::max(0.0, variance);
  }
  residual = std::max(residual, 0.1 * total);
  Factors factors;
  for (const std::vector<double>& of_term : variances) {
    const std::size_t k = of_term.size();
    Dense factor(k * k, 0.0);
    for (std::size_t c = 0; c < k; ++c) {
      const bool known = of_term[c] > 0.0 && residual > 0.0;
      factor[c * k + c] = known ? std::clamp(std::sqrt(of_term[c] / residual), 0.1, 10.0) : 1.0;
    }
    factors.push_back(std::move(factor));
  }
  return factors;
}

Factors start_factors(const ScaledDesign& design, const FitOptions& options) {
  if (!options.start.empty()) {
    Factors factors = to_scaled(design, unpacked(design.model(), options.start, false));
    // The criterion is flat around factors of zeros: a search that begins there would stay.
    for (std::size_t t = 0; t < factors.size(); ++t) {
      const auto k = at(design.terms()[t].k);
      for (std::size_t c = 0; c < k; ++c) factors[t][c * k + c] = std::max(factors[t][c * k + c], 1e-2);
    }
    return factors;
  }
  return moment_factors(design);
}

Factors given_factors(const ScaledDesign& design, const FitOptions& options) {
  const double residual = options.variances.back();
  if (!(residual > 0.0)) {
    throw ModelError({.what = fmt::format("the residual variance is {}", residual),
                      .expected = "a positive number",
                      .advice = "give the residual variance last"});
  }
  Factors factors = unpacked(design.model(), options.variances, true);
  for (std::size_t t = 0; t < factors.size(); ++t) {
    for (double& element : factors[t]) element /= residual;
    std::optional<Dense> factor = lower_factor_of_covariance(factors[t], at(design.terms()[t].k));
    if (!factor) {
      throw ModelError({.variable = design.model().random[t].group,
                        .what = "the given covariance matrix is not positive semidefinite",
                        .advice = "correct its variances or covariances"});
    }
    factors[t] = std::move(*factor);
  }
  return to_scaled(design, std::move(factors));
}

class Fitter {
 public:
  Fitter(const Model& model, Module& module, const FitOptions& options)
      : model_(model), options_(options), design_(model), likelihood_(module, design_, options.reml) {
    fit_.reml = options.reml;
    fit_.variances_given = !options.variances.empty();
  }

  Fit run() {
    if (fit_.variances_given) {
      use_given();
    } else {
      search();
    }
    return std::move(fit_);
  }

 private:
  CriterionParts evaluate(const Factors& factors) {
    CriterionParts parts = likelihood_.evaluate(factors, false);
    if (!parts.defined) {
      throw ModelError(
          {.what = likelihood_.doubt().empty() ? "the fixed effects explain the response exactly" : likelihood_.doubt(),
           .advice = "simplify the model, or look for rounding in its columns"});
    }
    return parts;
  }

  void use_given() {
    const Factors factors = given_factors(design_, options_);
    const CriterionParts parts = evaluate(factors);
    const double variance = options_.variances.back();
    const Parameters parameters(factors);
    fit_.convergence = Convergence::converged;
    fit_.optimizer = "none: the variances are given";
    fit_.criterion = likelihood_.at_variance(parts, variance);
    set_variances(design_, factors, variance, fit_);
    for (std::size_t i = 0; i < options_.variances.size(); ++i) fit_.varcomp[i].vcov = options_.variances[i];
    finish({parameters, factors, variance, {}}, parts);
  }

  void search() {
    SearchOptions options;
    options.max_iterations = options_.max_iterations;
    options.derivative_free = options_.derivative_free;
    options.progress = options_.progress;
    Optimum optimum = find_optimum(likelihood_, start_factors(design_, options_), options);
    fit_.convergence = optimum.convergence;
    fit_.optimizer = optimum.optimizer;
    fit_.iterations = std::move(optimum.iterations);
    const Factors factors = optimum.factors();
    CriterionParts parts = evaluate(factors);
    const double variance = parts.s2 / likelihood_.degrees();
    fit_.criterion = likelihood_.profiled(parts);
    set_variances(design_, factors, variance, fit_);
    say_boundary(optimum.parameters);
    say_exact(factors);
    refuse_exact(parts);
    AtOptimum at_optimum{optimum.parameters, factors, variance, {}};
    if (fit_.convergence == Convergence::converged) {
      at_optimum.covariance = observed_covariance(likelihood_, optimum, variance);
      set_observed_information(design_, optimum.parameters, optimum.values, variance, at_optimum.covariance, fit_);
      parts = evaluate(factors);
      set_average_information(likelihood_, optimum.parameters, optimum.values, variance, fit_);
      say_undetermined();
    }
    set_ratios(options_.ratios, fit_);
    finish(at_optimum, parts);
  }

  void say_boundary(const Parameters& parameters) {
    for (std::size_t t = 0; t < model_.random.size(); ++t) {
      if (parameters.full(t)) continue;
      fit_.singular = true;
      const RandomTerm& term = model_.random[t];
      if (parameters.rank(t) == 0) {
        fit_.messages.push_back(fmt::format("the estimate for '{}' is on the boundary: its variance is zero{}",
                                            term.group, term.coefs.size() > 1 ? " for every coefficient" : ""));
      } else {
        fit_.messages.push_back(
            fmt::format("the estimate for '{}' is on the boundary: its covariance matrix of {} coefficients has rank "
                        "{} (a variance "
                        "of zero, or a correlation of one)",
                        term.group, term.coefs.size(), parameters.rank(t)));
      }
    }
  }

  // What is left is rounding, and so is every number that would be made of it.
  void refuse_exact(const CriterionParts& parts) const {
    constexpr double kRounding = 1e-13;
    long double size = 0.0L;
    for (std::size_t i = 0; i < model_.y.size(); ++i) size += design_.weight(i) * model_.y[i] * model_.y[i];
    if (static_cast<long double>(parts.s2) > kRounding * kRounding * size) return;
    throw ModelError({.variable = model_.response,
                      .what = "the fixed effects explain the response exactly: nothing is left for a variance",
                      .expected = "observations that vary about what the fixed effects say",
                      .advice = "look for a term that the response was computed from"});
  }

  // Where random effects explain every observation the relative factors grow for ever, and the search ends somewhere.
  // In the coordinates of the design the squares of a factor sum to the mean variance that its term gives to a record:
  // variances of coefficients have the units of their covariates, and would say nothing.
  void say_exact(const Factors& factors) {
    constexpr double kPractically = 1e-9;
    constexpr double kSmall = 1e-6;
    double relative = 1.0;
    double largest = 0.0;
    std::size_t term = 0;
    for (std::size_t t = 0; t < factors.size(); ++t) {
      double squares = 0.0;
      for (const double element : factors[t]) squares += element * element;
      relative += squares;
      if (squares > largest) term = t;
      largest = std::max(largest, squares);
    }
    if (relative * kPractically < 1.0) return;
    fit_.singular = true;
    fit_.messages.push_back(
        spread_of_residuals() < kSmall
            ? "the residual variance is practically zero: the random effects explain every observation, and its value "
              "and that of the others are where the search ended"
            : undetermined(model_.random[term].group));
    fit_.obstacle = fit_.messages.back();
  }

  static std::string undetermined(const std::string& group) {
    return fmt::format(
        "the data do not determine the variance of '{}': the fixed effects explain the differences "
        "between its levels, and its value is where the search ended; leave the term out",
        group);
  }

  // A criterion that is flat but for rounding has its optimum everywhere.
  void say_undetermined() {
    constexpr double kNothing = 1e4;  // standard errors
    for (const VarianceComponent& component : fit_.varcomp) {
      if (!component.var2.empty() || !component.se_observed) continue;
      if (!(*component.se_observed > kNothing * component.vcov)) continue;
      fit_.messages.push_back(undetermined(component.group));
    }
  }

  // The sum of squares of the residuals as a part of that of the response about its mean.
  double spread_of_residuals() const {
    const auto rows = static_cast<double>(model_.y.size());
    const double mean = std::accumulate(model_.y.begin(), model_.y.end(), 0.0) / rows;
    double left = 0.0;
    double all = 0.0;
    for (std::size_t i = 0; i < model_.y.size(); ++i) {
      left += likelihood_.residual()[i] * likelihood_.residual()[i];
      all += (model_.y[i] - mean) * (model_.y[i] - mean);
    }
    return left / all;
  }

  void finish(const AtOptimum& optimum, const CriterionParts& parts) {
    fit_.loglik = -0.5 * fit_.criterion;
    fit_.observations = model_.rows();
    fit_.n_par = model_.fixed.rank() + static_cast<std::int64_t>(fit_.varcomp.size());
    fit_.aic = fit_.criterion + 2.0 * static_cast<double>(fit_.n_par);
    fit_.bic = fit_.criterion + static_cast<double>(fit_.n_par) * std::log(static_cast<double>(model_.rows()));
    fit_.df_residual = model_.rows() - fit_.n_par;
    fit_.ypy = parts.s2 / optimum.variance;
    fit_.residuals = likelihood_.residual();
    fit_.fitted = model_.y;
    for (std::size_t i = 0; i < fit_.fitted.size(); ++i) fit_.fitted[i] -= fit_.residuals[i];
    fit_.rank_equations = likelihood_.equations().rank();
    set_log_det(optimum);
    set_fixed_effects(likelihood_, optimum, options_.max_vcov, fit_);
    set_contrasts(likelihood_, optimum, options_.contrasts, fit_);
    fit_.equations = likelihood_.equations().facts();
    if (options_.spy) {
      fit_.spy_equations = likelihood_.equations().spy_equations();
      fit_.spy_factor = likelihood_.equations().spy_factor();
    }
    set_random_effects(likelihood_, optimum, fit_);
  }

  // Of the equations of u instead of b, times the inverse of the residual variance, in the coordinates of the model.
  void set_log_det(const AtOptimum& optimum) {
    double log_det = likelihood_.equations().log_det();
    for (std::size_t t = 0; t < model_.random.size(); ++t) {
      const auto k = at(design_.terms()[t].k);
      const Dense lower = lower_factor(model_factor(design_, optimum.factors, t), k);
      for (std::size_t c = 0; c < k; ++c) {
        log_det -= 2.0 * static_cast<double>(design_.terms()[t].levels) * std::log(lower[c * k + c]);
      }
    }
    for (const std::int64_t j : model_.fixed.kept)
      log_det += 2.0 * static_cast<double>(std::log(design_.basis().norm[at(j)]));
    fit_.log_det_equations = log_det - static_cast<double>(fit_.rank_equations) * std::log(optimum.variance);
  }

  const Model& model_;
  const FitOptions& options_;
  ScaledDesign design_;
  Likelihood likelihood_;
  Fit fit_;
};

}  // namespace

Fit fit(const Model& model, Module& module, const FitOptions& options) {
  const auto begun = std::chrono::steady_clock::now();
  check(model, options);
  Fit result = Fitter(model, module, options).run();
  result.seconds = std::chrono::duration<double>(std::chrono::steady_clock::now() - begun).count();
  return result;
}

EquationFacts plan(const Model& model, Module& module, bool reml) {
  const ScaledDesign design(model);
  const Gram gram(design);
  const Equations all(module, design, gram, Part::all);
  EquationFacts facts = all.facts();
  if (!reml) {
    const Equations random(module, design, gram, Part::random);
    facts.bytes += random.facts().bytes;
  }
  return facts;
}

std::vector<double> predict(const Fit& fit, const SparseColumns& x, const std::vector<PredictionTerm>& terms) {
  std::vector<double> predicted(at(x.rows), 0.0);
  for (std::int64_t j = 0; j < x.cols(); ++j) {
    if (fit.fixef[at(j)].aliased) continue;
    for (auto p = at(x.start[at(j)]); p < at(x.start[at(j) + 1]); ++p) {
      predicted[at(x.row[p])] += x.value[p] * fit.fixef[at(j)].estimate;
    }
  }
  std::size_t effect = 0;
  for (const PredictionTerm& term : terms) {
    if (predicted.empty()) return predicted;
    const std::size_t k = term.z.size() / predicted.size();
    for (std::size_t i = 0; i < predicted.size(); ++i) {
      if (term.level[i] < 0) continue;
      for (std::size_t c = 0; c < k; ++c) {
        predicted[i] += term.z[i * k + c] * fit.ranef[effect + c].estimate[at(term.level[i])];
      }
    }
    effect += k;
  }
  return predicted;
}

}  // namespace sm::mixed
