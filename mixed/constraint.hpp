// Singular precisions. The covariance of such a term is its variance times the Moore-Penrose inverse of the precision:
// its effects are orthogonal to the null vectors. When these are null vectors of the equations too, as with an
// intercept beside a Gaussian field, the factor drops rows and its solution is one of many: it is moved to the one
// wanted. Otherwise conditioning on the orthogonality leads there (Rue and Held 2005, section 2.3.3).
#pragma once

#include "mixed/equations.hpp"

namespace sm::mixed {

// A' x = 0, A the null vectors of the precisions, one for each coefficient.
class Constraint {
 public:
  explicit Constraint(const ScaledDesign& design);
  bool empty() const { return vectors_.empty(); }

  // For the factor that the equations have now: a few solves for each null vector.
  void prepare(Equations& equations);
  // What to add to the log-determinant of the accepted pivots for that of the constrained equations.
  double log_det() const { return log_det_; }
  // Moves solutions of the equations, x - F A'x.
  void apply(std::span<double> solutions) const;
  // b - A F'b: right-hand sides for which the moved solutions are the covariances with b'x of the moved solution.
  void apply_transposed(std::span<double> right) const;
  // What to add to element (i, j) of C^- for the covariance of the moved solution.
  double covariance(std::size_t i, std::size_t j) const;

 private:
  struct NullVector {
    std::size_t first;   // its first unknown
    std::size_t stride;  // between levels
    std::vector<double> value;
  };
  std::vector<double> products(std::span<const double> x) const;  // A' x for one vector

  std::vector<NullVector> vectors_;
  double log_det_ = 0.0;
  std::size_t order_ = 0;
  std::vector<double> shift_;    // F, order x vectors: x - F A'x is the moved solution
  std::vector<double> inverse_;  // C^- A
  std::vector<double> between_;  // A' C^- A
};

}  // namespace sm::mixed
