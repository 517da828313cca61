#include "mixed/variances.hpp"

#include <algorithm>
#include <cmath>
#include <limits>

#include "mixed/factor_algebra.hpp"

namespace sm::mixed {
namespace {

std::size_t at(std::int64_t i) { return static_cast<std::size_t>(i); }

constexpr double kFlat = 1e-9;  // curvatures, relative to those of single parameters, that are none
constexpr double kRounding = 1e-14;

// Elements (a, b) of a lower triangle by columns.
template <class Visit>
void for_triangle(std::size_t n, Visit visit) {
  for (std::size_t b = 0; b < n; ++b) {
    for (std::size_t a = b; a < n; ++a) visit(a, b);
  }
}

std::size_t triangle(std::size_t n) { return n * (n + 1) / 2; }

}  // namespace

Dense model_factor(const ScaledDesign& design, const Factors& factors, std::size_t term) {
  return multiplied(design.terms()[term].basis, factors[term], at(design.terms()[term].k));
}

void set_variances(const ScaledDesign& design, const Factors& factors, double variance, Fit& fit) {
  fit.sigma = std::sqrt(variance);
  for (std::size_t t = 0; t < factors.size(); ++t) {
    const RandomTerm& term = design.model().random[t];
    const auto k = at(term.coef_count());
    const Dense factor = model_factor(design, factors, t);
    const Dense lower = lower_factor(factor, k);
    const Dense covariance = multiplied_transposed(factor, factor, k);
    for_triangle(k, [&](std::size_t a, std::size_t b) {
      fit.theta.push_back(lower[b * k + a]);
      VarianceComponent component;
      component.group = term.group;
      component.var1 = term.coefs[b];
      if (a != b) component.var2 = term.coefs[a];
      component.vcov = variance * covariance[b * k + a];
      const double product = covariance[a * k + a] * covariance[b * k + b];
      if (a == b) {
        component.sdcor = std::sqrt(component.vcov);
      } else {
        component.sdcor = product > 0.0 ? std::clamp(covariance[b * k + a] / std::sqrt(product), -1.0, 1.0)
                                        : std::numeric_limits<double>::quiet_NaN();
      }
      fit.varcomp.push_back(std::move(component));
      if (a == b && lower[a * k + a] == 0.0) fit.singular = true;
    });
  }
  VarianceComponent residual;
  residual.group = "Residual";
  residual.vcov = variance;
  residual.sdcor = fit.sigma;
  fit.varcomp.push_back(std::move(residual));
}

namespace {

struct Derivatives {
  std::vector<double> log_det;
  std::vector<double> s2;
};

Derivatives derivatives_at(Likelihood& likelihood, const Parameters& parameters, const std::vector<double>& values) {
  const CriterionParts parts = likelihood.evaluate(parameters.factors(values), true);
  if (!parts.defined) return {};
  return {parameters.gradient(parts.log_det_gradient), parameters.gradient(parts.s2_gradient)};
}

// What is a large change of each value: for one in a row of a factor the size of that row, the standard deviation of
// its coefficient over that of the residual. One size for all would hide small coefficients beside large ones.
std::vector<double> natural_lengths(const Parameters& parameters, const std::vector<double>& values) {
  constexpr double kLeast = 0.05;
  const Factors factors = parameters.factors(values);
  std::vector<double> lengths;
  for (std::size_t j = 0; j < values.size(); ++j) {
    const Parameters::Place& place = parameters.places()[j];
    const std::size_t k = parameters.order(place.term);
    double row = 0.0;
    double largest = 0.0;
    for (std::size_t i = 0; i < k * k; ++i) {
      const double element = factors[place.term][i];
      if (i % k == place.row) row += element * element;
      largest = std::max(largest, std::abs(element));
    }
    if (row == 0.0) row = largest > 0.0 ? largest * largest : 1.0;
    lengths.push_back(std::max(std::abs(values[j]), kLeast * std::sqrt(row)));
  }
  return lengths;
}

bool is_cheap(Likelihood& likelihood) {
  return likelihood.design().unknowns() <= 50000 && likelihood.equations().facts().flops <= 1e8;
}

// The Hessian of log_det + s2 / variance from central differences of its gradient; of two steps' differences the
// leading error is taken out (Richardson).
Dense factor_hessian(Likelihood& likelihood, const Parameters& parameters, const std::vector<double>& values,
                     double variance) {
  const std::size_t m = values.size();
  const std::vector<double> lengths = natural_lengths(parameters, values);
  Dense hessian(m * m, 0.0);
  for (std::size_t j = 0; j < m; ++j) {
    const double step = 2e-3 * lengths[j];
    const auto difference = [&](double h) {
      std::vector<double> there = values;
      there[j] = values[j] + h;
      const Derivatives up = derivatives_at(likelihood, parameters, there);
      there[j] = values[j] - h;
      const Derivatives down = derivatives_at(likelihood, parameters, there);
      std::vector<double> slope(m, std::numeric_limits<double>::quiet_NaN());
      if (up.s2.empty() || down.s2.empty()) return slope;
      for (std::size_t i = 0; i < m; ++i) {
        slope[i] = (up.log_det[i] - down.log_det[i] + (up.s2[i] - down.s2[i]) / variance) / (2.0 * h);
      }
      return slope;
    };
    std::vector<double> slope = difference(step);
    const std::vector<double> half = difference(0.5 * step);
    for (std::size_t i = 0; i < m; ++i) slope[i] = (4.0 * half[i] - slope[i]) / 3.0;
    for (std::size_t i = 0; i < m; ++i) {
      hessian[j * m + i] += 0.5 * slope[i];
      hessian[i * m + j] += 0.5 * slope[i];
    }
  }
  return hessian;
}

// That of d log(s2 / d) + log_det, where s2 / d is the variance, without what the variance's moving along takes from it.
Dense at_fixed_variance(const Dense& profiled, const std::vector<double>& s2, double variance, double degrees) {
  Dense hessian = profiled;
  for (std::size_t j = 0; j < s2.size(); ++j) {
    for (std::size_t i = 0; i < s2.size(); ++i) {
      hessian[j * s2.size() + i] += s2[i] * s2[j] / (degrees * variance * variance);
    }
  }
  return hessian;
}

}  // namespace

ParameterCovariance observed_covariance(Likelihood& likelihood, const Optimum& optimum, double variance) {
  const std::size_t m = optimum.values.size();
  const bool cheap = is_cheap(likelihood);
  Dense hessian;
  if (cheap) hessian = factor_hessian(likelihood, optimum.parameters, optimum.values, variance);
  const Derivatives here = derivatives_at(likelihood, optimum.parameters, optimum.values);
  if (!cheap) hessian = at_fixed_variance(optimum.hessian, here.s2, variance, likelihood.degrees());
  // Half the second derivatives of d log v + log_det + s2 / v, by log v at the end.
  Dense information((m + 1) * (m + 1), 0.0);
  for (std::size_t j = 0; j < m; ++j) {
    for (std::size_t i = 0; i < m; ++i) information[j * (m + 1) + i] = 0.5 * hessian[j * m + i];
    information[j * (m + 1) + m] = information[m * (m + 1) + j] = -0.5 * here.s2[j] / variance;
  }
  information[m * (m + 1) + m] = 0.5 * likelihood.degrees();
  ParameterCovariance result{.covariance = {}, .count = m + 1};
  if (std::optional<Dense> inverse = inverse_of_definite(information, m + 1, kFlat))
    result.covariance = std::move(*inverse);
  return result;
}

namespace {

// Derivatives of the free components by the free elements of the factors and the logarithm of the residual variance.
Dense component_jacobian(const ScaledDesign& design, const Parameters& parameters, const std::vector<double>& values,
                         double variance, const Fit& fit) {
  const std::size_t columns = values.size() + 1;
  const std::size_t rows = fit.free.size();
  Dense jacobian(rows * columns, 0.0);
  const Factors factors = parameters.factors(values);
  for (std::size_t i = 0; i < rows; ++i) jacobian[values.size() * rows + i] = fit.varcomp[fit.free[i]].vcov;
  for (std::size_t j = 0; j < values.size(); ++j) {
    const Parameters::Place& place = parameters.places()[j];
    if (!parameters.full(place.term)) continue;
    const std::size_t k = parameters.order(place.term);
    Factors unit = factors;
    std::fill(unit[place.term].begin(), unit[place.term].end(), 0.0);
    unit[place.term][place.col * k + place.row] = 1.0;
    const Dense left = model_factor(design, unit, place.term);
    const Dense half = multiplied_transposed(left, model_factor(design, factors, place.term), k);
    std::size_t first = 0;
    for (std::size_t t = 0; t < place.term; ++t) first += triangle(parameters.order(t));
    const auto row =
        static_cast<std::size_t>(std::lower_bound(fit.free.begin(), fit.free.end(), first) - fit.free.begin());
    std::size_t e = 0;
    for_triangle(k, [&](std::size_t a, std::size_t b) {
      jacobian[j * rows + row + e++] = variance * (half[b * k + a] + half[a * k + b]);
    });
  }
  return jacobian;
}

void set_free(const Parameters& parameters, std::size_t terms, Fit& fit) {
  std::size_t first = 0;
  for (std::size_t t = 0; t < terms; ++t) {
    const std::size_t count = triangle(parameters.order(t));
    for (std::size_t i = 0; i < count && parameters.full(t); ++i) fit.free.push_back(first + i);
    first += count;
  }
  fit.free.push_back(first);
}

void set_information(const Dense& covariance, std::optional<double> VarianceComponent::*se, Dense Fit::*information,
                     Fit& fit) {
  const std::size_t count = fit.free.size();
  const std::optional<Dense> inverse = inverse_of_definite(covariance, count, kRounding);
  for (std::size_t i = 0; i < count; ++i) fit.varcomp[fit.free[i]].*se = std::sqrt(covariance[i * count + i]);
  if (inverse) fit.*information = *inverse;
}

}  // namespace

void set_observed_information(const ScaledDesign& design, const Parameters& parameters,
                              const std::vector<double>& values, double variance, const ParameterCovariance& covariance,
                              Fit& fit) {
  set_free(parameters, design.terms().size(), fit);
  if (!covariance.known()) {
    fit.messages.emplace_back(
        "the likelihood is flat in some direction of the variance components: they have no standard errors, and the "
        "model may have more of them than the data can tell apart");
    return;
  }
  const Dense jacobian = component_jacobian(design, parameters, values, variance, fit);
  set_information(congruence(jacobian, covariance.covariance, fit.free.size(), covariance.count),
                  &VarianceComponent::se_observed, &Fit::information_observed, fit);
}

namespace {

// W^-1 r has the residual e of the working response w: V'Py for one component, with P w = W (w - M x).
class AverageInformation {
 public:
  explicit AverageInformation(Likelihood& likelihood, const Factors& factors)
      : likelihood_(likelihood), design_(likelihood.design()), factors_(factors) {}

  // The derivative of V by element (a, b) of the covariance of a term, times P y.
  void add_component(std::size_t t, std::size_t a, std::size_t b) {
    const DesignTerm& term = design_.terms()[t];
    const auto k = at(term.k);
    const Dense inverse = inverse_of(factors_[t], k);
    std::vector<double> effects(at(design_.unknowns()), 0.0);
    for (std::int64_t l = 0; l < term.levels; ++l) {
      const std::size_t first = at(term.first + l * term.k);
      const auto element = [&](std::size_t c) {  // of K^- Z'P y = T'^-1 b
        double sum = 0.0;
        for (std::size_t e = 0; e < k; ++e) sum += inverse[c * k + e] * likelihood_.solution()[first + e];
        return sum;
      };
      effects[first + a] += element(b);
      if (a != b) effects[first + b] += element(a);
    }
    std::vector<double> working(at(design_.rows()), 0.0);
    design_.subtract_product(effects, working);
    for (double& value : working) value = -value;
    add(std::move(working));
  }
  void add_residual() { add(likelihood_.residual()); }

  // w_i'P w_j / (2 variance): of components relative to the residual variance.
  Dense information(double variance) const {
    const std::size_t count = residuals_.size();
    Dense result(count * count);
    for (std::size_t i = 0; i < count; ++i) {
      std::vector<double> product(solutions_[i].size(), 0.0);
      add_precision_product(design_, solutions_[i], 1.0, product);
      for (std::size_t j = 0; j < count; ++j) {
        double sum = 0.0;
        for (std::size_t r = 0; r < residuals_[i].size(); ++r) {
          sum += design_.weight(r) * residuals_[i][r] * residuals_[j][r];
        }
        for (std::size_t u = 0; u < at(design_.random_count()); ++u) sum += product[u] * solutions_[j][u];
        result[i * count + j] = 0.5 * sum / variance;
      }
    }
    return result;
  }

 private:
  void add(std::vector<double> working) {
    Likelihood::Solution solved = likelihood_.solve_response(working, factors_, 0);
    residuals_.push_back(std::move(solved.residual));
    solutions_.push_back(std::move(solved.unknowns));
  }

  Likelihood& likelihood_;
  const ScaledDesign& design_;
  const Factors& factors_;
  std::vector<std::vector<double>> residuals_;
  std::vector<std::vector<double>> solutions_;
};

// Covariances of the components in the coordinates of the model from those in which they are well conditioned.
Dense coordinate_jacobian(const ScaledDesign& design, const Parameters& parameters, std::size_t count) {
  Dense jacobian(count * count, 0.0);
  std::size_t first = 0;
  for (std::size_t t = 0; t < design.terms().size(); ++t) {
    if (!parameters.full(t)) continue;
    const std::size_t k = parameters.order(t);
    const Dense& basis = design.terms()[t].basis;
    std::size_t column = first;
    for_triangle(k, [&](std::size_t c, std::size_t d) {
      std::size_t row = first;
      for_triangle(k, [&](std::size_t a, std::size_t b) {
        double value = basis[c * k + a] * basis[d * k + b];
        if (c != d) value += basis[d * k + a] * basis[c * k + b];
        jacobian[column * count + row++] = value;
      });
      ++column;
    });
    first += triangle(k);
  }
  jacobian[count * count - 1] = 1.0;
  return jacobian;
}

}  // namespace

void set_average_information(Likelihood& likelihood, const Parameters& parameters, const std::vector<double>& values,
                             double variance, Fit& fit) {
  const ScaledDesign& design = likelihood.design();
  const Factors factors = parameters.factors(values);
  AverageInformation average(likelihood, factors);
  for (std::size_t t = 0; t < factors.size(); ++t) {
    if (!parameters.full(t)) continue;
    for_triangle(parameters.order(t), [&](std::size_t a, std::size_t b) { average.add_component(t, a, b); });
  }
  average.add_residual();
  const std::size_t count = fit.free.size();
  const std::optional<Dense> inverse = inverse_of_definite(average.information(variance), count, kFlat);
  if (!inverse) return;
  Dense covariance = congruence(coordinate_jacobian(design, parameters, count), *inverse, count, count);
  for (double& value : covariance) value *= variance * variance;
  set_information(covariance, &VarianceComponent::se_average, &Fit::information_average, fit);
}

void set_ratios(const std::vector<RatioRequest>& requests, Fit& fit) {
  std::vector<double> vcov;
  for (const VarianceComponent& component : fit.varcomp) vcov.push_back(component.vcov);
  const std::optional<Dense> covariance =
      fit.information_observed.empty() ? std::nullopt
                                       : inverse_of_definite(fit.information_observed, fit.free.size(), kRounding);
  for (const RatioRequest& request : requests) {
    Ratio ratio;
    ratio.name = request.name;
    std::vector<double> gradient(vcov.size(), 0.0);
    ratio.estimate = request.value(vcov, gradient);
    if (covariance) {
      Dense row;
      for (const std::size_t i : fit.free) row.push_back(gradient[i]);
      ratio.se_delta = std::sqrt(congruence(row, *covariance, 1, row.size())[0]);
    }
    fit.ratios.push_back(std::move(ratio));
  }
}

}  // namespace sm::mixed
