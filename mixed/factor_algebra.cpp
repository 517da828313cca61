#include "mixed/factor_algebra.hpp"

#include <algorithm>
#include <cmath>
#include <numeric>
#include <span>

#include "mixed/vectors.hpp"

namespace sm::mixed {
namespace {

constexpr double kRounding = 1e-13;

void subtract(double factor, std::span<const double> a, std::span<double> from) {
  for (std::size_t i = 0; i < a.size(); ++i) from[i] -= factor * a[i];
}

void divide(std::span<double> a, double by) {
  for (double& element : a) element /= by;
}

std::span<double> column(Dense& a, std::size_t j, std::size_t rows) { return {&a[j * rows], rows}; }

}  // namespace

Dense multiplied(const Dense& a, const Dense& b, std::size_t n) { return product(a, b, n, n, n); }

Dense multiplied_transposed(const Dense& a, const Dense& b, std::size_t n) {
  return product(a, transposed(b, n, n), n, n, n);
}

Dense inverse_of_triangle(const Dense& upper, std::size_t n) {
  Dense inverse = identity(n);
  for (std::size_t j = 0; j < n; ++j) {
    const std::span<double> x = column(inverse, j, n);
    for (std::size_t i = j + 1; i-- > 0;) {
      x[i] /= upper[i * n + i];
      subtract(x[i], {&upper[i * n], i}, x);
    }
  }
  return inverse;
}

// By columns, each less what those before it have for it.
std::optional<Dense> cholesky_factor(const Dense& symmetric, std::size_t n) {
  Dense lower(n * n, 0.0);
  for (std::size_t j = 0; j < n; ++j) {
    std::copy(&symmetric[j * n] + j, &symmetric[j * n] + n, &lower[j * n] + j);
    const std::span<double> left = column(lower, j, n).subspan(j);
    for (std::size_t l = 0; l < j; ++l) subtract(lower[l * n + j], column(lower, l, n).subspan(j), left);
    if (!(left[0] > 0.0)) return std::nullopt;
    divide(left, std::sqrt(left[0]));
  }
  return lower;
}

// Rows are made orthogonal one after the other; a row within the span of those before it gets no column of its own.
Dense lower_factor(const Dense& factor, std::size_t n) {
  Dense rows = transposed(factor, n, n);
  Dense lower(n * n, 0.0);
  Dense directions(n * n, 0.0);
  for (std::size_t i = 0; i < n; ++i) {
    const std::span<double> row = column(rows, i, n);
    const double length = norm(row);
    for (int pass = 0; pass < 2; ++pass) {
      for (std::size_t j = 0; j < i; ++j) {
        const double along = dot(column(directions, j, n), row);
        subtract(along, column(directions, j, n), row);
        lower[j * n + i] += along;
      }
    }
    const double left = norm(row);
    if (left <= kRounding * length) continue;
    lower[i * n + i] = left;
    divide(row, left);
    std::copy(row.begin(), row.end(), column(directions, i, n).begin());
  }
  return lower;
}

std::optional<Dense> lower_factor_of_covariance(const Dense& covariance, std::size_t n) {
  // As correlations: a variance that is small beside another is as good as that.
  std::vector<double> scale(n, 1.0);
  Dense correlations = covariance;
  for (std::size_t i = 0; i < n; ++i) {
    if (covariance[i * n + i] > 0.0) scale[i] = std::sqrt(covariance[i * n + i]);
  }
  for (std::size_t j = 0; j < n; ++j) {
    for (std::size_t i = 0; i < n; ++i) correlations[j * n + i] /= scale[i] * scale[j];
  }
  Eigensystem eigen = eigensystem(correlations, n);
  if (n > 0 && !(eigen.values.front() >= -1e-12 * std::max(eigen.values.back(), 0.0))) return std::nullopt;
  for (double& value : eigen.values) value = std::sqrt(std::max(value, 0.0));
  Dense root = scaled_columns(std::move(eigen.vectors), eigen.values);
  for (std::size_t j = 0; j < n; ++j) {
    for (std::size_t i = 0; i < n; ++i) root[j * n + i] *= scale[i];
  }
  return lower_factor(root, n);
}

std::vector<double> singular_values(const Dense& factor, std::size_t n) { return singular_system(factor, n).values; }

ReducedFactor reduced(const Dense& factor, std::size_t n, double limit) {
  SingularSystem svd = singular_system(factor, n);
  ReducedFactor result;
  while (result.rank < n && svd.values[result.rank] >= limit) ++result.rank;
  std::fill(svd.values.begin() + static_cast<std::ptrdiff_t>(result.rank), svd.values.end(), 0.0);
  Dense rows = transposed(scaled_columns(std::move(svd.left), svd.values), n, n);
  result.rows.resize(n);
  std::iota(result.rows.begin(), result.rows.end(), std::size_t{0});
  result.factor.assign(n * n, 0.0);
  // Each column of the result belongs to the row that is longest outside the span of the rows before.
  for (std::size_t c = 0; c < result.rank; ++c) {
    const auto length = [&](std::size_t row) { return norm(column(rows, row, n)); };
    const auto longest = std::max_element(result.rows.begin() + static_cast<std::ptrdiff_t>(c), result.rows.end(),
                                          [&](std::size_t a, std::size_t b) { return length(a) < length(b); });
    std::swap(result.rows[c], *longest);
    const std::span<double> chosen = column(rows, result.rows[c], n);
    std::vector<double> direction(chosen.begin(), chosen.end());
    divide(direction, norm(direction));
    for (std::size_t row = 0; row < n; ++row) {
      const double along = dot(direction, column(rows, row, n));
      const auto place = std::find(result.rows.begin(), result.rows.end(), row) - result.rows.begin();
      if (static_cast<std::size_t>(place) >= c) result.factor[c * n + row] = along;
      subtract(along, direction, column(rows, row, n));
    }
  }
  return result;
}

SmallestEigenvalue smallest_eigenvalue(const Dense& symmetric, std::size_t n) {
  const Eigensystem eigen = eigensystem(symmetric, n);
  return {eigen.values[0], {eigen.vectors.begin(), eigen.vectors.begin() + static_cast<std::ptrdiff_t>(n)}};
}

std::optional<Dense> inverse_of_definite(const Dense& symmetric, std::size_t n, double limit) {
  std::vector<double> scale(n);
  for (std::size_t i = 0; i < n; ++i) {
    if (!(symmetric[i * n + i] > 0.0)) return std::nullopt;
    scale[i] = 1.0 / std::sqrt(symmetric[i * n + i]);
  }
  const auto scaled = [&](const Dense& a) {
    return transposed(scaled_columns(transposed(scaled_columns(a, scale), n, n), scale), n, n);
  };
  Eigensystem eigen = eigensystem(scaled(symmetric), n);
  if (n > 0 && !(eigen.values[0] > limit)) return std::nullopt;
  for (double& value : eigen.values) value = 1.0 / value;
  return scaled(multiplied_transposed(scaled_columns(eigen.vectors, eigen.values), eigen.vectors, n));
}

Dense congruence(const Dense& j, const Dense& c, std::size_t rows, std::size_t n) {
  return product(product(j, c, rows, n, n), transposed(j, rows, n), rows, n, rows);
}

}  // namespace sm::mixed
