// A symmetric matrix on its way through the module, phase by phase, with the time that each takes.
#pragma once

#include <cstdint>
#include <string>
#include <vector>

#include "cli/module_session.hpp"
#include "cli/progress.hpp"
#include "cli/sparse.hpp"

namespace sm::cli {

struct Phase {
  std::string name;
  double seconds = 0.0;
  double flops = 0.0;  // 0: not counted

  double gflops() const { return flops > 0.0 && seconds > 0.0 ? flops / seconds / 1e9 : 0.0; }
};

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
  // Enters the upper triangle element by element (qxsmnewss, qxsmassign in add mode) and closes it, with tolerance 0:
  // zeros off the diagonal are not kept, as they would only add fill. Throws CommandError.
  Factorization(ModuleSession& session, const CompressedRows& upper, Progress& progress);

  void analyse();  // qxsmmd, qxsmreorder, qxsmsymbfact
  bool factor();   // qxsmnumfact; false when the matrix is not positive semidefinite

  // b and x hold n doubles for each of `count` right-hand sides. After factor().
  void solve(const double* b, double* x, std::int64_t count);

  // The diagonal of the inverse, or of the generalized inverse that dropped pivots leave. After factor().
  std::vector<double> inverse_diagonal();

  std::int64_t order() const { return order_; }
  const FactorCounts& counts() const { return counts_; }
  std::int64_t rank() const { return rank_; }
  double log_determinant() const { return log_determinant_; }
  std::vector<std::int64_t> dropped_rows() const;  // from 1, ascending
  const std::vector<Phase>& phases() const { return phases_; }

 private:
  template <class Work>
  auto timed(const std::string& name, Work work, double flops = 0.0);
  void enter(const CompressedRows& upper);
  void count();

  ModuleSession& session_;
  Progress& progress_;
  std::int64_t order_;
  SmMatrix* matrix_ = nullptr;  // goes back with the instance
  FactorCounts counts_;
  std::int64_t rank_ = 0;
  double log_determinant_ = 0.0;
  std::vector<Phase> phases_;
};

}  // namespace sm::cli
