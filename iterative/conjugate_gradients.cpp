// Conjugate gradients with a diagonal preconditioner.
//
// Method: Hestenes and Stiefel, "Methods of conjugate gradients for solving linear systems", J. Res. Nat. Bur.
// Standards 49 (1952) 409-436, with the Jacobi preconditioner; the residual is recomputed every 50 steps against drift.
#include <algorithm>
#include <bit>
#include <cmath>

#include "cholesky/ginverse2.hpp"
#include "cholesky/steps.hpp"
#include "forms/kernels.hpp"
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

// One entry of the preconditioner: 1 and the generalized inverse of the diagonal element.
struct PreconditionerBlock {
  double one;
  double inverse;
};

// The table of blocks, given back whatever happens.
class Preconditioner {
 public:
  explicit Preconditioner(SmMatrix& m) : m_(m) {}
  ~Preconditioner() {
    for (PreconditionerBlock*& block : table_.span()) give_back(m_.pool, block);
  }
  Preconditioner(const Preconditioner&) = delete;
  Preconditioner& operator=(const Preconditioner&) = delete;

  [[nodiscard]] SmStatus build() {
    SM_TRY(table_.take(m_.pool, m_.rows, Fill::zero));
    for (i64 i = 0; i < m_.rows; ++i) {
      PreconditionerBlock*& block = table_.data()[i];
      SM_TRY(allocate(m_.pool, 1, Fill::none, block));
      *block = {1.0, diagonal(i)};
      SM_TRY(invert(block->inverse));
    }
    return SM_OK;
  }

  void apply(const double* r, double* z) {
    for (i64 i = 0; i < m_.rows; ++i) z[i] = table_.data()[i]->inverse * r[i];
  }

 private:
  double diagonal(i64 i) const {
    if (m_.format != SM_FORMAT_SPARSE) {
      return m_.values[with_packed(m_.format, m_.rows, [&](auto layout) { return layout.diagonal(i); })];
    }
    const i64 p = m_.row_start[i];
    return p < m_.row_start[i + 1] && m_.col_index[p] == i ? m_.nz_values[p] : 0.0;
  }
  SmStatus invert(double& d) {
    double log_det = 0.0;
    i64 rank = 0;
    std::int16_t definite = 0;
    return ginverse2(m_.instance, &d, 1, &log_det, &rank, kPackedInverse, singularity_tolerance(m_), SM_FORMAT_ROWS,
                     &definite);
  }

  SmMatrix& m_;
  Scratch<PreconditionerBlock*> table_;
};

class ConjugateGradients {
 public:
  ConjugateGradients(SmMatrix& m, const IterativeTask& task) : m_(m), task_(task), preconditioner_(m) {}

  [[nodiscard]] SmStatus prepare() {
    SM_TRY(need_pool(m_));
    SM_TRY(preconditioner_.build());
    std::fill_n(task_.x, task_.count * m_.rows, 0.0);
    SM_TRY(r_.take(m_.pool, m_.rows));
    SM_TRY(p_.take(m_.pool, m_.rows));
    return q_.take(m_.pool, m_.rows);
  }
  [[nodiscard]] SmStatus solve(const double* b, double* x);

 private:
  SmStatus product(const double* from, double* to) {
    return qxsmmultv(&m_, from, to, 0, m_.rows - 1, 0, m_.rows - 1, 1, 0);
  }
  SmStatus exact_residual(const double* b, const double* x) {
    SM_TRY(product(x, q_.data()));
    for (i64 i = 0; i < m_.rows; ++i) r_.data()[i] = b[i] - q_.data()[i];
    return SM_OK;
  }
  SmStatus step(const double* b, double* x, i64 k, double& rho);
  bool told_to_stop(double rho, i64 k) {
    const ProgressWords* words = progress_words(*m_.instance);
    return words->callback && words->callback(words->context, rho, m_.solver_word, k) != 0;
  }

  SmMatrix& m_;
  const IterativeTask& task_;
  Preconditioner preconditioner_;
  Scratch<double> r_, p_, q_;
};

// q serves three times: for the direction's product, for A x when the residual is recomputed, and for the
// preconditioned residual; each is used up before the next.
SmStatus ConjugateGradients::step(const double* b, double* x, i64 k, double& rho) {
  double* r = r_.data();
  double* p = p_.data();
  double* q = q_.data();
  const std::int32_t n = static_cast<std::int32_t>(m_.rows);
  SM_TRY(product(p, q));
  const double alpha = rho / hzvdot11(p, q, m_.rows);
  hzvaxpy(x, x, p, n, alpha);
  if (k % kExactResidualEvery == 0) {
    SM_TRY(exact_residual(b, x));
  } else {
    hzvaxpy(r, r, q, n, -alpha);
  }
  double* z = q;
  preconditioner_.apply(r, z);
  const double next = hzvdot11(r, z, m_.rows);
  const double beta = next / rho;
  for (i64 i = 0; i < m_.rows; ++i) p[i] = z[i] + beta * p[i];
  rho = next;
  return SM_OK;
}

SmStatus ConjugateGradients::solve(const double* b, double* x) {
  SM_TRY(exact_residual(b, x));
  preconditioner_.apply(r_.data(), p_.data());
  double& rho = task_.residual;
  i64& k = task_.iterations;
  rho = hzvdot11(r_.data(), p_.data(), m_.rows);
  const double bound = task_.tolerance * task_.tolerance * rho;
  k = 0;
  // A measure that is not a number can neither converge nor improve.
  while (k < task_.max_iterations && !(rho <= bound) && !std::isnan(rho)) {
    SM_TRY(step(b, x, k, rho));
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
