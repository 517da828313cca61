// The plain road: everything happens in a copy of the triangle by columns, whatever the format: column k of R, of its
// inverse and of the result are contiguous there, and the caller's array is written when nothing can fail any more.
//
// Inversion by R^-1 R^-T as in LAPACK's packed routines: Anderson et al., "LAPACK Users' Guide", 3rd ed., SIAM (1999).
#include "cholesky/ginverse2.hpp"

#include <algorithm>

#include "cholesky/packed_roads.hpp"
#include "forms/kernels.hpp"
#include "frame/memory.hpp"
#include "store/layouts.hpp"

namespace sm {

namespace {

double* column(double* t, i64 k) { return t + k * (k + 1) / 2; }

void load(const double* array, std::int32_t format, i64 n, double* t) {
  with_packed(format, n, [&](auto layout) {
    for (i64 c = 0; c < n; ++c) {
      for (i64 r = 0; r <= c; ++r) column(t, c)[r] = array[layout.at(r, c)];
    }
  });
}

void store(const double* t, std::int32_t format, i64 n, double* array) {
  with_packed(format, n, [&](auto layout) {
    for (i64 c = 0; c < n; ++c) {
      for (i64 r = 0; r <= c; ++r) array[layout.at(r, c)] = t[c * (c + 1) / 2 + r];
    }
  });
}

// A -> R, column by column: entry (i, k) needs columns i and k above row i. A dropped row i has r_ii = 0, and its
// entries are set to 0.
SmStatus to_factor(double* t, i64 n, double tolerance) {
  for (i64 k = 0; k < n; ++k) {
    double* rk = column(t, k);
    for (i64 i = 0; i < k; ++i) {
      const double* ri = column(t, i);
      rk[i] = ri[i] > 0.0 ? (rk[i] - hzvdot11(ri, rk, i)) / ri[i] : 0.0;
    }
    SM_TRY(find_root(rk[k], tolerance, rk[k] - hzvdot11(rk, rk, k), rk[k]));
  }
  return SM_OK;
}

// R -> T, the inverse of its accepted block in place; rows and columns of dropped pivots become 0. Column k of T is
// -T(above) R(:,k) / r_kk; row i of R is 0 where i is dropped, so no product reaches such a row.
void invert_triangle(double* t, i64 n) {
  for (i64 k = 0; k < n; ++k) {
    double* tk = column(t, k);
    if (!(tk[k] > 0.0)) {
      std::fill_n(tk, k + 1, 0.0);
      continue;
    }
    const double reciprocal = 1.0 / tk[k];
    for (i64 j = 0; j < k; ++j) {  // column j of T, scaled by r_jk, ends at row j
      const double r = tk[j];
      const double* tj = column(t, j);
      if (r != 0.0) hzvaxpy(tk, tk, tj, static_cast<std::int32_t>(j), r);
      tk[j] = tj[j] * r;
    }
    for (i64 i = 0; i < k; ++i) tk[i] *= -reciprocal;
    tk[k] = reciprocal;
  }
}

// T -> T T': column k adds its outer product to the triangle before it, then becomes its own part of the result.
void multiply_by_transpose(double* t, i64 n) {
  for (i64 k = 0; k < n; ++k) {
    double* tk = column(t, k);
    for (i64 c = 0; c < k; ++c) {
      if (tk[c] != 0.0) hzvaxpy(column(t, c), column(t, c), tk, static_cast<std::int32_t>(c + 1), tk[c]);
    }
    const double last = tk[k];
    for (i64 i = 0; i <= k; ++i) tk[i] *= last;
  }
}

}  // namespace

SmStatus ginverse2_by_columns(MemoryPool* pool, const PackedJob& job, PackedReport& report) {
  const i64 n = job.n;
  // Order 1 is what a diagonal preconditioner asks for, once a row: it costs no allocation.
  double single = 0.0;
  Scratch<double> work;
  if (n > 1) SM_TRY(work.take(pool, n * (n + 1) / 2));
  double* t = n > 1 ? work.data() : &single;
  load(job.array, job.format, n, t);
  if (job.mode != kPackedFactorToInverse) SM_TRY(to_factor(t, n, job.tolerance));
  for (i64 k = 0; k < n; ++k) report.take(column(t, k)[k]);
  if (job.mode != kPackedFactor) {
    invert_triangle(t, n);
    multiply_by_transpose(t, n);
  }
  store(t, job.format, n, job.array);
  return SM_OK;
}

SmStatus invert_pivot(double a, double tolerance, double& inverse) {
  double root = 0.0;
  SM_TRY(find_root(a, tolerance, a, root));
  const double reciprocal = root > 0.0 ? 1.0 / root : 0.0;
  inverse = reciprocal * reciprocal;
  return SM_OK;
}

SmStatus ginverse2(SmInstance* instance, double* array, i64 n, double* log_det, i64* rank, std::int32_t mode,
                   double tolerance, std::int32_t format, std::int16_t* definite) {
  const PackedJob job = {array, n, format, mode, tolerance};
  PackedReport report;
  const auto road = n < kLeastSlabOrder ? ginverse2_by_columns : ginverse2_in_slabs;
  const SmStatus status = road(instance->pool, job, report);
  if (status == SM_NOT_DEFINITE) *definite = 0;
  SM_TRY(status);
  *log_det = report.log_det;
  *rank = report.rank;
  *definite = 1;
  return SM_OK;
}

}  // namespace sm
