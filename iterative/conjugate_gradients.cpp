// Conjugate gradients with a diagonal preconditioner.
//
// Method: Hestenes and Stiefel, "Methods of conjugate gradients for solving linear systems", J. Res. Nat. Bur.
// Standards 49 (1952) 409-436, with the Jacobi preconditioner; the residual is recomputed every 50 steps against drift.
#include <algorithm>
#include <bit>
#include <cmath>

#include "cholesky/ginverse2.hpp"
#include "cholesky/steps.hpp"
#include "forms/lanes.hpp"
#include "forms/operations.hpp"
#include "forms/passes.hpp"
#include "frame/memory.hpp"
#include "iterative/operations.hpp"
#include "store/checks.hpp"
#include "store/layouts.hpp"

namespace sm {

namespace {

constexpr i64 kExactResidualEvery = 50;
constexpr double kSingularDiagonal = std::bit_cast<double>(SM_TOLERANCE_BITS);

// Where an instance keeps its progress callback: the two words that the zeroing allocator leaves behind the one-word
// block.
struct ProgressWords {
  std::int64_t spare;
  SmProgress callback;
  void* context;
};

ProgressWords* progress_words(SmInstance& instance) { return reinterpret_cast<ProgressWords*>(instance.spare_word); }

class ConjugateGradients {
 public:
  ConjugateGradients(SmMatrix& m, const IterativeTask& task) : m_(m), task_(task) {}

  [[nodiscard]] SmStatus prepare() {
    SM_TRY(need_pool(m_));
    SM_TRY(inverse_.take(m_.pool, m_.rows));
    for (i64 i = 0; i < m_.rows; ++i) SM_TRY(invert_pivot(diagonal(i), singularity_tolerance(m_), inverse_.data()[i]));
    std::fill_n(task_.x, task_.count * m_.rows, 0.0);
    if (m_.format == SM_FORMAT_SPARSE) {
      SM_TRY(list_.take(m_.pool, list_words(m_.rows)));
      passes_.list_rows(UpperRows(m_), list_.data());
    }
    SM_TRY(r_.take(m_.pool, m_.rows));
    SM_TRY(p_.take(m_.pool, m_.rows));
    return q_.take(m_.pool, m_.rows);
  }
  [[nodiscard]] SmStatus solve(const double* b, double* x);

 private:
  double diagonal(i64 i) const {
    if (m_.format != SM_FORMAT_SPARSE) {
      return m_.values[with_packed(m_.format, m_.rows, [&](auto layout) { return layout.diagonal(i); })];
    }
    const i64 p = m_.row_start[i];
    return p < m_.row_start[i + 1] && m_.col_index[p] == i ? m_.nz_values[p] : 0.0;
  }
  SmStatus product(const double* from, double* to) {
    const Range all = {0, m_.rows - 1};
    return multiply(m_, {from, to, 1, false}, all, all);
  }
  // r <- b - A x; q is used up. Answers rho.
  SmStatus exact_residual(const double* b, const double* x, double& rho) {
    SM_TRY(product(x, q_.data()));
    rho = passes_.measure(m_.rows, b, q_.data(), inverse_.data(), r_.data());
    return SM_OK;
  }
  // p <- M r + beta p, q <- A p, and p'q.
  SmStatus direct(double beta, double& curvature);
  SmStatus step(const double* b, double* x, i64 k, double beta, double& rho);
  bool told_to_stop(double rho, i64 k) {
    const ProgressWords* words = progress_words(*m_.instance);
    return words->callback && words->callback(words->context, rho, m_.solver_word, k) != 0;
  }

  SmMatrix& m_;
  const IterativeTask& task_;
  const Passes& passes_ = passes();
  Scratch<double> inverse_;  // of the diagonal elements, 0 for one that has none
  Scratch<i64> list_;        // of the rows of A, which stay the same from step to step
  Scratch<double> r_, p_, q_;
};

SmStatus ConjugateGradients::direct(double beta, double& curvature) {
  double* p = p_.data();
  double* q = q_.data();
  const Direction direction = {inverse_.data(), r_.data(), beta, p, q};
  if (m_.format == SM_FORMAT_SPARSE) {
    curvature = passes_.direct(UpperRows(m_), list_.data(), direction);
    return SM_OK;
  }
  for (i64 i = 0; i < m_.rows; ++i) p[i] = direction.inverse[i] * direction.r[i] + beta * p[i];
  SM_TRY(product(p, q));
  curvature = lane_dot(p, q, m_.rows);
  return SM_OK;
}

// The direction of a step is made in the step, from the rho of the last two: its product with A then finds it in the
// caches.
SmStatus ConjugateGradients::step(const double* b, double* x, i64 k, double beta, double& rho) {
  double curvature = 0.0;
  SM_TRY(direct(beta, curvature));
  const double alpha = rho / curvature;
  if (k % kExactResidualEvery == 0) {
    lane_add(x, p_.data(), m_.rows, alpha);
    return exact_residual(b, x, rho);
  }
  rho = passes_.advance({m_.rows, alpha, p_.data(), q_.data(), inverse_.data(), x, r_.data()});
  return SM_OK;
}

SmStatus ConjugateGradients::solve(const double* b, double* x) {
  double& rho = task_.residual;
  i64& k = task_.iterations;
  SM_TRY(exact_residual(b, x, rho));
  const double bound = task_.tolerance * task_.tolerance * rho;
  std::fill_n(p_.data(), m_.rows, 0.0);
  double beta = 0.0;
  k = 0;
  // A measure that is not a number can neither converge nor improve.
  while (k < task_.max_iterations && !(rho <= bound) && !std::isnan(rho)) {
    const double before = rho;
    SM_TRY(step(b, x, k, beta, rho));
    beta = rho / before;
    ++k;
    if (told_to_stop(rho, k)) return SM_NOT_CONVERGED;
  }
  return rho <= bound ? SM_OK : SM_NOT_CONVERGED;
}

void solve_diagonal(const SmMatrix& m, const IterativeTask& task) {
  for (i64 v = 0; v < task.count; ++v) {
    for (i64 i = 0; i < m.rows; ++i) {
      const double d = m.values[i];
      task.x[v * m.rows + i] = std::fabs(d) <= kSingularDiagonal ? 0.0 : task.b[v * m.rows + i] / d;
    }
  }
}

Gate may_iterate(const SmMatrix& m, const IterativeTask& task) {
  SM_STOP_WITH(may_read(m));
  SM_STOP_IF(task.b == task.x, SM_BAD_ARGUMENT);
  return {};
}

}  // namespace

SmStatus solve_iterative(SmMatrix& m, IterativeTask task) {
  SM_PASS(may_iterate(m, task));  // these refusals leave the two results alone
  task.iterations = 0;
  task.residual = 0.0;
  if (m.kind != SM_KIND_SYMMETRIC && m.kind != SM_KIND_DIAGONAL) return SM_UNAVAILABLE;
  if (task.count < 1) return SM_OK;
  if (m.kind == SM_KIND_DIAGONAL) {
    solve_diagonal(m, task);
    return SM_OK;
  }
  if (task.max_iterations < 1) task.max_iterations = m.rows + 2;
  if (!(task.tolerance >= 0.0)) task.tolerance = singularity_tolerance(m);
  ConjugateGradients gradients(m, task);
  SM_TRY(gradients.prepare());
  for (i64 v = 0; v < task.count; ++v) SM_TRY(gradients.solve(task.b + v * m.rows, task.x + v * m.rows));
  return SM_OK;
}

void set_progress(SmInstance& instance, SmProgress callback, void* context) {
  ProgressWords* words = progress_words(instance);
  words->callback = callback;
  words->context = context;
}

}  // namespace sm
