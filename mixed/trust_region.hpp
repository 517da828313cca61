// Steps on a quadratic model g'p + p'Hp/2 of a function, H symmetric and of any signature.
#pragma once

#include <span>
#include <vector>

namespace sm::mixed {

// Eigenvalues, ascending, and eigenvectors of D^-1 H D^-1, which has a diagonal of about 1 whatever the parameters are
// measured in.
struct Spectrum {
  std::vector<double> scale;    // the diagonal of D
  std::vector<double> values;   // ascending
  std::vector<double> vectors;  // by columns

  std::size_t order() const { return scale.size(); }
  // An eigenvector as a step of the parameters, D^-1 v.
  std::vector<double> direction(std::size_t j) const;
};

// Curvatures of less than this part of the diagonal are below what differences of gradients tell apart from zero.
constexpr double kFlat = 1e-6;

// D from the absolute value of H: the diagonal of H where that is positive definite, and never smaller than what H has
// beside the diagonal. `natural` are lengths of the parameters, for those that H says nothing about.
std::vector<double> curvature_scale(std::span<const double> hessian, std::span<const double> natural);

Spectrum decompose(std::span<const double> hessian, std::span<const double> scale);

// g' |H|^-1 g, where curvatures below kFlat count as kFlat.
double newton_decrement(const Spectrum& spectrum, std::span<const double> gradient);

struct TrialStep {
  std::vector<double> p;
  double length = 0.0;     // |D p|
  double predicted = 0.0;  // the decrease of the model
  bool bounded = false;    // whether the radius kept it short
};

// The global minimum of the model within |D p| <= radius (More and Sorensen 1983), in the basis of the eigenvectors.
// Where the gradient is orthogonal to a direction of negative curvature, the step goes to the border along that.
TrialStep trust_region_step(const Spectrum& spectrum, std::span<const double> gradient, double radius);

}  // namespace sm::mixed
