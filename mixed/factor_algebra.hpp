// The relative covariance factors of terms, and matrices of information.
#pragma once

#include <optional>

#include "mixed/dense.hpp"

namespace sm::mixed {

Dense multiplied(const Dense& a, const Dense& b, std::size_t n);             // A B
Dense multiplied_transposed(const Dense& a, const Dense& b, std::size_t n);  // A B'
Dense inverse_of_triangle(const Dense& upper, std::size_t n);
// L with L L' = the matrix; none where it is not positive definite.
std::optional<Dense> cholesky_factor(const Dense& symmetric, std::size_t n);

// The lower triangular L with L L' = F F' and a diagonal that is not negative; zeros where F F' is singular.
Dense lower_factor(const Dense& factor, std::size_t n);
// The same from a covariance, nothing when that is not positive semidefinite.
std::optional<Dense> lower_factor_of_covariance(const Dense& covariance, std::size_t n);

// What is left of a factor when its singular values below `limit` are taken for zeros: `rank` columns that are not
// zero, lower triangular when the rows are taken in the order `rows`.
struct ReducedFactor {
  Dense factor;
  std::size_t rank = 0;
  std::vector<std::size_t> rows;
};
std::vector<double> singular_values(const Dense& factor, std::size_t n);  // descending
ReducedFactor reduced(const Dense& factor, std::size_t n, double limit);

struct SmallestEigenvalue {
  double value = 0.0;
  std::vector<double> vector;
};
SmallestEigenvalue smallest_eigenvalue(const Dense& symmetric, std::size_t n);

// The inverse of a symmetric positive definite matrix; nothing when, scaled to a unit diagonal, it has an eigenvalue
// below the limit.
std::optional<Dense> inverse_of_definite(const Dense& symmetric, std::size_t n, double limit);

// J C J' for J rows x n.
Dense congruence(const Dense& j, const Dense& c, std::size_t rows, std::size_t n);

}  // namespace sm::mixed
