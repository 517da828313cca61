// Dense matrices by columns, for what is small: the covariance factors of terms, matrices of information, constraints.
// All decompositions are Eigen's of singular values, accurate to rounding of the largest and one template to compile.
#pragma once

#include <cstddef>
#include <vector>

namespace sm::mixed {

using Dense = std::vector<double>;

Dense identity(std::size_t n);
Dense product(const Dense& a, const Dense& b, std::size_t rows, std::size_t inner, std::size_t columns);  // A B
Dense transposed(const Dense& a, std::size_t rows, std::size_t columns);
Dense scaled_columns(Dense a, const std::vector<double>& scale);  // A diag(scale)

// NaN where the matrix is not finite, as in all that follows.
Dense inverse_of(const Dense& a, std::size_t n);
double log_abs_det(const Dense& a, std::size_t n);  // 0 for n = 0

struct Eigensystem {
  std::vector<double> values;  // ascending
  Dense vectors;
};
Eigensystem eigensystem(const Dense& symmetric, std::size_t n);

// A = U S V'.
struct SingularSystem {
  std::vector<double> values;  // descending
  Dense left;                  // U
};
SingularSystem singular_system(const Dense& a, std::size_t n);

// An orthonormal basis, rows x (rows - columns), of what is orthogonal to the columns of a matrix of full rank.
Dense complement(const Dense& a, std::size_t rows, std::size_t columns);

}  // namespace sm::mixed
