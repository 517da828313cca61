// Substitution through the factor, products with a stored inverse, and the one-call solve.
#include <algorithm>

#include "cholesky/ginverse2.hpp"
#include "cholesky/packed_triangle.hpp"
#include "cholesky/steps.hpp"
#include "forms/kernels.hpp"
#include "store/checks.hpp"
#include "store/operations.hpp"

namespace sm {

namespace {

// U'D then U, in the new order. w is the record's scratch.
class SparseSolve {
 public:
  explicit SparseSolve(const SmMatrix& m)
      : m_(m), w_(reinterpret_cast<double*>(m.factor_scratch)), iu_(m.factor_iu), values_(m.factor_values) {}

  void run(const double* b, double* x) {
    for (i64 k = 0; k < m_.rows; ++k) w_[k] = b[m_.perm[k]];
    for (i64 k = 0; k < m_.rows; ++k) forward(k);
    for (i64 k = m_.rows - 1; k >= 0; --k) x[m_.perm[k]] = w_[k] += row_product(k);
  }

 private:
  void forward(i64 k) {
    const double wk = w_[k];
    const i64* column = m_.factor_ju + m_.factor_iju[k];
    for (i64 p = iu_[k]; p < iu_[k + 1]; ++p) w_[*column++] += values_[p] * wk;
    w_[k] = m_.factor_diag[k] * wk;
  }
  // Eight lanes, which the header of the package promises nothing about but the last bits.
  double row_product(i64 k) const {
    const i64* column = m_.factor_ju + m_.factor_iju[k];
    const double* value = values_ + iu_[k];
    const i64 length = iu_[k + 1] - iu_[k];
    i64 t = 0;
    double s[8] = {};
    for (; t + 8 <= length; t += 8) {
      for (int lane = 0; lane < 8; ++lane) s[lane] += value[t + lane] * w_[column[t + lane]];
    }
    double sum = ((s[0] + s[4]) + (s[2] + s[6])) + ((s[1] + s[5]) + (s[3] + s[7]));
    for (; t < length; ++t) sum += value[t] * w_[column[t]];
    return sum;
  }

  const SmMatrix& m_;
  double* w_;
  const i64* iu_;
  const double* values_;
};

SmStatus substitute_packed(SmMatrix& m, const double* b, double* x, std::int32_t count) {
  Scratch<double> work;
  SM_TRY(need_pool(m));
  SM_TRY(work.take(m.pool, m.rows));
  with_packed(m.format, m.rows, [&](auto layout) {
    for (i64 v = 0; v < count; ++v) {
      std::copy_n(b + v * m.rows, m.rows, work.data());
      solve_transposed(layout, factor_array(m), work.data());
      solve_upper(layout, factor_array(m), work.data(), m.rows - 1);
      std::copy_n(work.data(), m.rows, x + v * m.rows);
    }
  });
  return SM_OK;
}

void substitute_diagonal(SmMatrix& m, const double* b, double* x, std::int32_t count) {
  const double* root = factor_array(m);
  for (i64 v = 0; v < count; ++v, b += m.rows, x += m.rows) {
    for (i64 i = 0; i < m.rows; ++i) x[i] = root[i] > 0.0 ? b[i] / (root[i] * root[i]) : 0.0;
  }
}

SmStatus substitute_symmetric(SmMatrix& m, const double* b, double* x, std::int32_t count) {
  if (!x) count = 0;  // nothing to write to, nothing to solve
  if (x) std::fill_n(x, m.rows, 0.0);
  if (is_dense_format(m.format)) return substitute_packed(m, b, x, count);
  if (m.format != SM_FORMAT_SPARSE) return SM_UNAVAILABLE;
  SparseSolve solve(m);
  for (i64 v = 0; v < count; ++v) solve.run(b + v * m.rows, x + v * m.rows);
  return SM_OK;
}

Gate may_substitute(const SmMatrix& m, const double* b, const double* x) {
  SM_STOP_WITH(may_read(m));
  SM_STOP_IF(m.state != SM_STATE_FACTORED, SM_WRONG_STATE);
  SM_STOP_IF(b == x, SM_BAD_ARGUMENT);
  return {};
}

// x <- G b for a packed symmetric G: each stored element serves both triangles.
template <class Layout>
void multiply_packed(const Layout& layout, const double* g, const double* b, double* x) {
  std::fill_n(x, layout.n, 0.0);
  for (i64 k = 0; k < layout.n; ++k) {
    const Segment s = segment(layout, g, k);
    x[k] += s.diagonal * b[k] + hzvdot11(s.off, b + s.first, s.count);
    hzvaxpy(x + s.first, x + s.first, s.off, static_cast<std::int32_t>(s.count), b[k]);
  }
}

void multiply_by_packed(const SmMatrix& m, const double* g, const double* b, double* x, i64 count) {
  with_packed(m.format, m.rows, [&](auto layout) {
    for (i64 v = 0; v < count; ++v) multiply_packed(layout, g, b + v * m.rows, x + v * m.rows);
  });
}

void multiply_by_diagonal(const SmMatrix& m, const double* g, const double* b, double* x, i64 count) {
  for (i64 v = 0; v < count; ++v, b += m.rows, x += m.rows) {
    for (i64 i = 0; i < m.rows; ++i) x[i] = g[i] * b[i];
  }
}

Gate may_apply_inverse(const SmMatrix& m, const double* b, const double* x) {
  SM_STOP_IF(m.nnz < 1, SM_OK);
  SM_STOP_IF(m.kind == SM_KIND_NONE, SM_UNTYPED);
  SM_STOP_IF(m.state < SM_STATE_FACTORED && !is_closed(m), SM_NOT_CLOSED);
  SM_STOP_IF(m.state >= SM_STATE_FACTORED && !m.row_start, SM_NO_FACTOR);
  SM_STOP_IF(b == x, SM_BAD_ARGUMENT);
  SM_STOP_IF(m.rows != m.cols, SM_NOT_SQUARE);
  return {};
}

SmStatus solve_diagonal(SmMatrix& m, const double* b, double* x, std::int32_t count) {
  const double tolerance = singularity_tolerance(m);
  const auto refused = [](double d) { return d < kDiagonalRefusal; };
  m.definite = 1;
  if (count < 1) return SM_OK;
  if (std::any_of(m.values, m.values + m.rows, refused)) {  // before x is touched
    m.definite = 0;
    return SM_NOT_DEFINITE;
  }
  for (i64 v = 0; v < count; ++v, b += m.rows, x += m.rows) {
    for (i64 i = 0; i < m.rows; ++i) x[i] = m.values[i] > tolerance ? b[i] / m.values[i] : 0.0;
  }
  return SM_OK;
}

// Turns the factor, or the matrix, into its generalized inverse. A separate array below state 5 is what a failed
// factorization left; it takes a fresh copy of the values.
SmStatus invert_packed(SmMatrix& m) {
  if (m.state > SM_STATE_FACTORED) return SM_OK;
  const bool factored = m.state == SM_STATE_FACTORED;
  if (!factored && m.dense_factor) std::copy_n(m.values, static_cast<i64>(m.value_count), m.dense_factor);
  SM_TRY(ginverse2(m.instance, factor_array(m), m.rows, &m.log_det, &m.rank,
                   factored ? kPackedFactorToInverse : kPackedInverse, singularity_tolerance(m), m.format,
                   &m.definite));
  m.state = SM_STATE_INVERTED;
  return SM_OK;
}

}  // namespace

SmStatus substitute(SmMatrix& m, const double* b, double* x, std::int32_t count) {
  SM_PASS(may_substitute(m, b, x));
  if (m.kind == SM_KIND_SYMMETRIC) return substitute_symmetric(m, b, x, count);
  if (m.kind != SM_KIND_DIAGONAL) return SM_UNAVAILABLE;
  substitute_diagonal(m, b, x, count);
  return SM_OK;
}

SmStatus apply_inverse(SmMatrix& m, const double* b, double* x, i64 count) {
  SM_PASS(may_apply_inverse(m, b, x));
  if (count > 0) std::fill_n(x, count * m.rows, 0.0);
  if (m.kind != SM_KIND_SYMMETRIC && m.kind != SM_KIND_DIAGONAL) return SM_UNAVAILABLE;
  if (m.state < SM_STATE_FACTORED) SM_TRY(factor(m, false));
  if (m.state == SM_STATE_INVERTED && m.kind == SM_KIND_DIAGONAL) {
    multiply_by_diagonal(m, m.dense_factor, b, x, count);
    return SM_OK;
  }
  if (m.state == SM_STATE_INVERTED && m.format == SM_FORMAT_ROWS) {
    multiply_by_packed(m, m.dense_factor, b, x, count);
    return SM_OK;
  }
  return substitute(m, b, x, static_cast<std::int32_t>(count));  // 102 for an inverse in format 22
}

SmStatus solve_direct(SmMatrix& m, const double* b, double* x, std::int32_t count) {
  if (m.nnz < 1) return SM_OK;
  if (m.kind == SM_KIND_NONE) return SM_UNTYPED;
  if (b == x) return SM_BAD_ARGUMENT;
  if (m.state < SM_STATE_CLOSED) SM_TRY(close(m, missing()));
  if (m.kind == SM_KIND_DIAGONAL) return solve_diagonal(m, b, x, count);
  if (m.kind != SM_KIND_SYMMETRIC) return SM_UNAVAILABLE;
  if (is_dense_format(m.format)) {
    SM_TRY(invert_packed(m));
    multiply_by_packed(m, factor_array(m), b, x, count);
    return SM_OK;
  }
  if (m.format != SM_FORMAT_SPARSE) return SM_UNAVAILABLE;
  SM_TRY(factor(m, false));
  return substitute(m, b, x, count);
}

}  // namespace sm
