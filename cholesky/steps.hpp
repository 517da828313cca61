// The steps of the sparse factorization and the operations built on the factor, behind the C boundary.
#pragma once

#include "frame/core.hpp"

namespace sm {

[[nodiscard]] SmStatus order(SmMatrix& m);
[[nodiscard]] SmStatus order_as_given(SmMatrix& m, const i64* perm);
[[nodiscard]] SmStatus reorder(SmMatrix& m);
[[nodiscard]] SmStatus factor_symbolic(SmMatrix& m);
[[nodiscard]] SmStatus factor_numeric(SmMatrix& m);

[[nodiscard]] SmStatus refill(SmMatrix& m, const double* values);

[[nodiscard]] SmStatus factor(SmMatrix& m, bool in_place);
// The array of a packed or diagonal matrix that is to be factored or inverted: the values themselves (a separate array
// goes back then), or a fresh copy of them in the separate array.
[[nodiscard]] SmStatus choose_array(SmMatrix& m, bool in_place, double*& array);
// Runs ginverse2 in one of its modes from A on the values, or on a fresh copy of them in the separate array.
[[nodiscard]] SmStatus transform_packed(SmMatrix& m, bool in_place, std::int32_t mode, double tolerance);
[[nodiscard]] SmStatus factor_packed(SmMatrix& m, bool in_place);
[[nodiscard]] SmStatus factor_diagonal(SmMatrix& m, bool in_place);
[[nodiscard]] SmStatus log_determinant(SmMatrix& m, double& out);
[[nodiscard]] SmStatus rank(SmMatrix& m, i64& out);

// x <- A^- b in the factor of a symmetric sparse matrix, with the record's scratch.
void substitute_sparse(const SmMatrix& m, const double* b, double* x, i64 count);
[[nodiscard]] SmStatus substitute(SmMatrix& m, const double* b, double* x, std::int32_t count);
[[nodiscard]] SmStatus apply_inverse(SmMatrix& m, const double* b, double* x, i64 count);
[[nodiscard]] SmStatus inverse_diagonal(SmMatrix& m, double* x);
// Adds the diagonal of A^- to x, from a sparse factor and without any memory, with the record's scratch.
void diagonal_by_columns(const SmMatrix& m, double* x);
[[nodiscard]] SmStatus inverse_on_pattern(SmMatrix& m, double* values);
[[nodiscard]] SmStatus solve_direct(SmMatrix& m, const double* b, double* x, std::int32_t count);

// The limits between which a pivot is dropped: accepted above |a| * tolerance, an error below the negative one.
// -0.1 is where -100 t would be nearer to zero than the noise of a matrix scaled to order one.
struct PivotLimits {
  double accept;
  double refuse;

  PivotLimits(double a, double tolerance) : accept((a < 0 ? -a : a) * tolerance) {
    refuse = accept < 0.1 ? -0.1 : -100.0 * accept;
  }
};

// A diagonal matrix is judged by absolute limits.
inline constexpr double kDiagonalRefusal = -0.0001;

inline double singularity_tolerance(const SmMatrix& m) { return m.instance->tolerances[2]; }

// Where the factor or the inverse of a packed or diagonal matrix is.
inline double* factor_array(SmMatrix& m) { return m.dense_factor ? m.dense_factor : m.values; }

}  // namespace sm
