#include "mixed/factor_algebra.hpp"

#include <Eigen/Dense>
#include <algorithm>
#include <cmath>
#include <numeric>

namespace sm::mixed {
namespace {

using Map = Eigen::Map<const Eigen::MatrixXd>;

Eigen::Index index(std::size_t i) { return static_cast<Eigen::Index>(i); }
Map map(const Dense& a, std::size_t n) { return {a.data(), index(n), index(n)}; }
Dense dense(const Eigen::MatrixXd& a) { return {a.data(), a.data() + a.size()}; }

constexpr double kRounding = 1e-13;

}  // namespace

Dense multiplied(const Dense& a, const Dense& b, std::size_t n) { return dense(map(a, n) * map(b, n)); }

Dense multiplied_transposed(const Dense& a, const Dense& b, std::size_t n) {
  return dense(map(a, n) * map(b, n).transpose());
}

Dense inverse_of_triangle(const Dense& upper, std::size_t n) {
  const Eigen::MatrixXd identity = Eigen::MatrixXd::Identity(index(n), index(n));
  return dense(map(upper, n).triangularView<Eigen::Upper>().solve(identity));
}

Dense inverse_of(const Dense& a, std::size_t n) { return dense(map(a, n).fullPivLu().inverse()); }

std::optional<Dense> cholesky_factor(const Dense& symmetric, std::size_t n) {
  const Eigen::LLT<Eigen::MatrixXd> llt(map(symmetric, n));
  if (llt.info() != Eigen::Success) return std::nullopt;
  return dense(Eigen::MatrixXd(llt.matrixL()));
}

// Rows are made orthogonal one after the other; a row within the span of those before it gets no column of its own.
Dense lower_factor(const Dense& factor, std::size_t n) {
  const Map f = map(factor, n);
  Eigen::MatrixXd lower = Eigen::MatrixXd::Zero(index(n), index(n));
  Eigen::MatrixXd directions = Eigen::MatrixXd::Zero(index(n), index(n));
  for (Eigen::Index i = 0; i < index(n); ++i) {
    Eigen::VectorXd row = f.row(i).transpose();
    const double length = row.norm();
    for (int pass = 0; pass < 2; ++pass) {
      const Eigen::VectorXd along = directions.leftCols(i).transpose() * row;
      row -= directions.leftCols(i) * along;
      lower.row(i).head(i) += along.transpose();
    }
    if (row.norm() <= kRounding * length) continue;
    lower(i, i) = row.norm();
    directions.col(i) = row / row.norm();
  }
  return dense(lower);
}

std::optional<Dense> lower_factor_of_covariance(const Dense& covariance, std::size_t n) {
  const Eigen::SelfAdjointEigenSolver<Eigen::MatrixXd> eigen(map(covariance, n));
  const Eigen::VectorXd& values = eigen.eigenvalues();
  if (values(0) < -1e-12 * std::max(values(index(n) - 1), 0.0) || !values.allFinite()) return std::nullopt;
  const Eigen::MatrixXd root = eigen.eigenvectors() * values.cwiseMax(0.0).cwiseSqrt().asDiagonal();
  return lower_factor(dense(root), n);
}

std::vector<double> singular_values(const Dense& factor, std::size_t n) {
  const Eigen::JacobiSVD<Eigen::MatrixXd> svd(map(factor, n));
  const Eigen::VectorXd& values = svd.singularValues();
  return {values.data(), values.data() + values.size()};
}

ReducedFactor reduced(const Dense& factor, std::size_t n, double limit) {
  const Eigen::JacobiSVD<Eigen::MatrixXd> svd(map(factor, n), Eigen::ComputeFullU);
  ReducedFactor result;
  while (result.rank < n && svd.singularValues()(index(result.rank)) >= limit) ++result.rank;
  const Eigen::Index rank = index(result.rank);
  Eigen::MatrixXd left = svd.matrixU().leftCols(rank) * svd.singularValues().head(rank).asDiagonal();
  result.rows.resize(n);
  std::iota(result.rows.begin(), result.rows.end(), std::size_t{0});
  // Each column of the result belongs to the row that is longest outside the span of the rows before.
  Eigen::MatrixXd lower = Eigen::MatrixXd::Zero(index(n), index(n));
  for (Eigen::Index c = 0; c < rank; ++c) {
    Eigen::Index best = c;
    for (Eigen::Index i = c; i < index(n); ++i) {
      if (left.row(index(result.rows[std::size_t(i)])).norm() > left.row(index(result.rows[std::size_t(best)])).norm())
        best = i;
    }
    std::swap(result.rows[std::size_t(c)], result.rows[std::size_t(best)]);
    const Eigen::RowVectorXd direction = left.row(index(result.rows[std::size_t(c)])).normalized();
    const Eigen::VectorXd along = left * direction.transpose();
    for (Eigen::Index i = c; i < index(n); ++i) {
      const Eigen::Index row = index(result.rows[std::size_t(i)]);
      lower(row, c) = along(row);
    }
    left -= along * direction;
  }
  result.factor = dense(lower);
  return result;
}

SmallestEigenvalue smallest_eigenvalue(const Dense& symmetric, std::size_t n) {
  const Eigen::SelfAdjointEigenSolver<Eigen::MatrixXd> eigen(map(symmetric, n));
  const Eigen::VectorXd vector = eigen.eigenvectors().col(0);
  return {eigen.eigenvalues()(0), {vector.data(), vector.data() + vector.size()}};
}

std::optional<Dense> inverse_of_definite(const Dense& symmetric, std::size_t n, double limit) {
  const Map a = map(symmetric, n);
  if (n == 0) return Dense{};
  if (!a.allFinite() || (a.diagonal().array() <= 0.0).any()) return std::nullopt;
  const Eigen::VectorXd scale = a.diagonal().cwiseSqrt().cwiseInverse();
  const Eigen::MatrixXd scaled = scale.asDiagonal() * a * scale.asDiagonal();
  const Eigen::SelfAdjointEigenSolver<Eigen::MatrixXd> eigen(scaled);
  if (eigen.eigenvalues()(0) <= limit) return std::nullopt;
  const Eigen::MatrixXd inverse =
      eigen.eigenvectors() * eigen.eigenvalues().cwiseInverse().asDiagonal() * eigen.eigenvectors().transpose();
  return dense(scale.asDiagonal() * inverse * scale.asDiagonal());
}

Dense congruence(const Dense& j, const Dense& c, std::size_t rows, std::size_t n) {
  const Map jacobian(j.data(), index(rows), index(n));
  return dense(jacobian * map(c, n) * jacobian.transpose());
}

}  // namespace sm::mixed
