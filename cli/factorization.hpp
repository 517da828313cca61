// A symmetric matrix on its way through the module, phase by phase, with the time that each takes.
#pragma once

#include <cstdint>
#include <vector>

#include "cli/loading.hpp"
#include "cli/module_session.hpp"
#include "cli/orderings.hpp"
#include "cli/phases.hpp"

namespace sm::cli {

// What the structure of U costs.
struct FactorCounts {
  std::int64_t entries = 0;     // of the closed upper triangle, with the diagonal
  std::int64_t nnz_u = 0;       // off-diagonal entries of U
  std::int64_t subscripts = 0;  // column subscripts stored for them
  // Operations of the numeric factorization: a row of U with L entries off the diagonal costs L(L + 2), that is L
  // multiplications by the reciprocal pivot and L(L + 1)/2 pairs of a multiplication and an addition.
  double flops = 0.0;

  double fill_ratio(std::int64_t n) const;  // entries of U with its diagonal, over entries
};

class Factorization {
 public:
  // Makes the matrix from its upper triangle. Zeros off the diagonal are not kept, as they would only add fill. Throws
  // CommandError.
  Factorization(ModuleSession& session, const LoadedMatrix& upper, PhaseClock& clock);

  // qxsmmd or qxsmorder, qxsmreorder, qxsmsymbfact. `limit` as in require_memory, for an order that is found outside
  // the module.
  void analyse(Ordering ordering, std::uint64_t limit);
  bool factor();  // qxsmnumfact; false when the matrix is not positive semidefinite

  // b and x hold n doubles for each of `count` right-hand sides. After factor().
  void solve(const double* b, double* x, std::int64_t count);

  // The diagonal of the inverse, or of the generalized inverse that dropped pivots leave. After factor().
  std::vector<double> inverse_diagonal();

  std::int64_t order() const { return order_; }
  const FactorCounts& counts() const { return counts_; }
  std::int64_t rank() const { return rank_; }
  double log_determinant() const { return log_determinant_; }
  std::vector<std::int64_t> dropped_rows() const;  // from 1, ascending
  SmMatrix* matrix() { return matrix_; }           // for operations of the module that need no more than the factor

 private:
  SmStatus order(Ordering ordering, std::uint64_t limit);
  void count();

  ModuleSession& session_;
  PhaseClock& clock_;
  std::int64_t order_;
  SmMatrix* matrix_;  // goes back with the instance
  FactorCounts counts_;
  std::int64_t rank_ = 0;
  double log_determinant_ = 0.0;
};

}  // namespace sm::cli
