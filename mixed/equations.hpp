// The mixed-model equations as a matrix of the module:
//
//   C = [ T'Z'WZT + K   T'Z'WX ]     T the relative covariance factors, K the precisions; in units of the residual
//       [    X'WZT       X'WX  ]     variance, the unknowns are (b, beta) with u = T b
//
// Assembled and ordered once: the factors change values only. Columns of X that depend on others, and rows without
// which a singular precision is regular, come last, so that theirs are the pivots that the factor drops.
#pragma once

#include <cstdint>
#include <functional>
#include <span>
#include <string>
#include <vector>

#include "mixed/blocks.hpp"
#include "mixed/fit.hpp"
#include "mixed/module.hpp"

namespace sm::mixed {

class Constraint;

class Equations {
 public:
  // Throws through Module::expect_ok. Keeps references to all three.
  Equations(Module& module, const ScaledDesign& design, const Gram& gram, Part part);
  // Of the random effects alone, in the order that `all` has them in: that fills in no more than there.
  Equations(const Equations& all, Part part);
  ~Equations();
  Equations(const Equations&) = delete;
  Equations& operator=(const Equations&) = delete;

  // False when the equations are not positive semidefinite, or pivots other than those expected were dropped: then
  // `doubt` says which. There is no factor to work with. `superfluous`: unknowns of singular precisions whose rows are
  // taken out.
  bool factor(const Factors& factors, const std::vector<std::int64_t>& superfluous);
  const std::string& doubt() const { return doubt_; }

  double log_det() const { return log_det_; }  // of the accepted pivots
  std::int64_t rank() const { return rank_; }
  std::int64_t order() const { return order_; }
  // Unknowns of singular precisions whose pivots were dropped: as many as null vectors of the precisions are null
  // vectors of the equations too.
  const std::vector<std::int64_t>& dropped() const { return dropped_; }

  // C^- b for `count` right-hand sides one after the other.
  std::vector<double> solve(std::span<const double> b, std::int64_t count = 1);

  // C b likewise.
  std::vector<double> product(std::span<const double> b, std::int64_t count) const;

  // The blocks of C^- where C has blocks, k x m by rows, on the diagonal whole; of the covariance of constrained
  // solutions where there is a constraint.
  void visit_inverse(const Constraint& constraint,
                     const std::function<void(const Block&, std::span<const double>)>& visit);
  // The derivatives by the elements of the factors, k x k by columns for each term, of log|C|, of the constrained
  // equations where there is a constraint.
  Factors log_det_gradient(const Factors& factors, const Constraint& constraint);

  EquationFacts facts() const;
  SpyPattern spy_equations() const;
  SpyPattern spy_factor() const;
  // Gives back the memory that only visit_inverse needs.
  void forget_inverse();

 private:
  Equations(Module& module, const ScaledDesign& design, const Gram& gram, Part part, const Equations* all);
  SmMatrix* assemble();
  void order_like(const Equations& all);
  void order_rows();
  void prepare_factor(SmMatrix* matrix);
  void order_and_analyse();
  std::vector<std::int64_t> last_rows() const;
  void fill(const Factors& factors);
  void refill(const std::vector<std::int64_t>& cleared);
  void find_places_of_last_rows();
  bool pivots_as_expected();

  Module& module_;
  const ScaledDesign& design_;
  const Gram& gram_;
  Part part_;
  std::int64_t order_ = 0;
  double flops_ = 0.0;  // of one factorization
  SmMatrix* matrix_ = nullptr;
  std::vector<std::int64_t> aliased_unknowns_;
  std::vector<std::int64_t> null_unknowns_;
  std::vector<std::vector<std::size_t>> last_places_;  // entries in the rows and columns of last_rows()
  bool without_aliased_ = false;  // columns of zeros stand for aliased ones, whose pivots drowned in rounding
  std::vector<double> values_;
  std::vector<double> inverse_;
  bool inverse_known_ = false;
  double log_det_ = 0.0;
  std::int64_t rank_ = 0;
  std::vector<std::int64_t> dropped_;
  std::string doubt_;
};

}  // namespace sm::mixed
