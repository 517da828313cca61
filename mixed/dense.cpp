#include "mixed/dense.hpp"

#include <Eigen/SVD>
#include <algorithm>
#include <cmath>
#include <limits>

namespace sm::mixed {
namespace {

using Matrix = Eigen::MatrixXd;
// Of square matrices, which need no decomposition beforehand.
using Decomposition = Eigen::JacobiSVD<Matrix, Eigen::NoQRPreconditioner>;

Decomposition decomposed(const Dense& a, std::size_t n, unsigned options) {
  const auto order = static_cast<Eigen::Index>(n);
  return Decomposition(Eigen::Map<const Matrix>(a.data(), order, order), options);
}

std::vector<double> list(const Eigen::VectorXd& v) { return {v.data(), v.data() + v.size()}; }
Dense dense(const Matrix& a) { return {a.data(), a.data() + a.size()}; }

bool finite(const Dense& a) {
  return std::all_of(a.begin(), a.end(), [](double element) { return std::isfinite(element); });
}

}  // namespace

Dense identity(std::size_t n) {
  Dense result(n * n, 0.0);
  for (std::size_t i = 0; i < n; ++i) result[i * n + i] = 1.0;
  return result;
}

Dense product(const Dense& a, const Dense& b, std::size_t rows, std::size_t inner, std::size_t columns) {
  Dense result(rows * columns, 0.0);
  for (std::size_t j = 0; j < columns; ++j) {
    for (std::size_t l = 0; l < inner; ++l) {
      for (std::size_t i = 0; i < rows; ++i) result[j * rows + i] += a[l * rows + i] * b[j * inner + l];
    }
  }
  return result;
}

Dense transposed(const Dense& a, std::size_t rows, std::size_t columns) {
  Dense result(a.size());
  for (std::size_t j = 0; j < columns; ++j) {
    for (std::size_t i = 0; i < rows; ++i) result[i * columns + j] = a[j * rows + i];
  }
  return result;
}

Dense scaled_columns(Dense a, const std::vector<double>& scale) {
  const std::size_t rows = scale.empty() ? 0 : a.size() / scale.size();
  for (std::size_t j = 0; j < scale.size(); ++j) {
    for (std::size_t i = 0; i < rows; ++i) a[j * rows + i] *= scale[j];
  }
  return a;
}

Dense inverse_of(const Dense& a, std::size_t n) {
  if (n == 0 || !finite(a)) return Dense(n * n, std::numeric_limits<double>::quiet_NaN());
  const Decomposition svd = decomposed(a, n, Eigen::ComputeFullU | Eigen::ComputeFullV);
  std::vector<double> reciprocal = list(svd.singularValues());
  for (double& value : reciprocal) value = 1.0 / value;
  return product(scaled_columns(dense(svd.matrixV()), reciprocal), transposed(dense(svd.matrixU()), n, n), n, n, n);
}

double log_abs_det(const Dense& a, std::size_t n) {
  double sum = 0.0;
  for (const double value : singular_system(a, n).values) sum += std::log(value);
  return sum;
}

// The singular values of a matrix that a shift has made positive semidefinite are its eigenvalues.
Eigensystem eigensystem(const Dense& symmetric, std::size_t n) {
  double largest = 0.0;
  for (const double element : symmetric) largest = std::max(largest, std::abs(element));
  const double shift = static_cast<double>(n) * largest;
  Dense positive = symmetric;
  for (std::size_t i = 0; i < n; ++i) positive[i * n + i] += shift;
  SingularSystem shifted = singular_system(positive, n);
  Eigensystem result;
  for (std::size_t j = n; j-- > 0;) {
    result.values.push_back(shifted.values[j] - shift);
    result.vectors.insert(result.vectors.end(), &shifted.left[j * n], &shifted.left[j * n] + n);
  }
  return result;
}

SingularSystem singular_system(const Dense& a, std::size_t n) {
  const double nothing = std::numeric_limits<double>::quiet_NaN();
  if (n == 0 || !finite(a)) return {.values = std::vector<double>(n, nothing), .left = Dense(n * n, nothing)};
  const Decomposition svd = decomposed(a, n, Eigen::ComputeFullU);
  return {.values = list(svd.singularValues()), .left = dense(svd.matrixU())};
}

Dense complement(const Dense& a, std::size_t rows, std::size_t columns) {
  Dense square = a;
  square.resize(rows * rows, 0.0);
  const Dense left = singular_system(square, rows).left;
  return {left.begin() + static_cast<std::ptrdiff_t>(rows * columns), left.end()};
}

}  // namespace sm::mixed
