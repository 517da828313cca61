#include "mixed/constraint.hpp"

#include <Eigen/Dense>
#include <cmath>

namespace sm::mixed {
namespace {

std::size_t at(std::int64_t i) { return static_cast<std::size_t>(i); }

double log_abs_det(const Eigen::MatrixXd& matrix) {
  if (matrix.size() == 0) return 0.0;
  return matrix.fullPivLu().matrixLU().diagonal().array().abs().log().sum();
}

Eigen::MatrixXd solved(Equations& equations, const Eigen::MatrixXd& b) {
  const std::vector<double> x = equations.solve({b.data(), at(b.size())}, b.cols());
  return Eigen::Map<const Eigen::MatrixXd>(x.data(), b.rows(), b.cols());
}

// What the unit vector of a dropped row loses on its way through C and C^-.
Eigen::MatrixXd null_vectors(Equations& equations) {
  const auto count = static_cast<Eigen::Index>(equations.dropped().size());
  Eigen::MatrixXd unit = Eigen::MatrixXd::Zero(equations.order(), count);
  for (Eigen::Index v = 0; v < count; ++v) unit(equations.dropped()[at(v)], v) = 1.0;
  const std::vector<double> product = equations.product({unit.data(), at(unit.size())}, count);
  return unit - solved(equations, Eigen::Map<const Eigen::MatrixXd>(product.data(), unit.rows(), count));
}

}  // namespace

Constraint::Constraint(const ScaledDesign& design) {
  for (const DesignTerm& term : design.terms()) {
    if (!term.precision || term.precision->nullity == 0) continue;
    const Precision& precision = *term.precision;
    const auto order = at(precision.order);
    for (std::size_t v = 0; v < at(precision.nullity); ++v) {
      const double* const vector = &precision.null_basis[v * order];
      for (std::size_t c = 0; c < at(term.k); ++c) {
        vectors_.push_back({at(term.first) + c, at(term.k), {vector, vector + order}});
      }
    }
  }
}

std::vector<double> Constraint::products(std::span<const double> x) const {
  std::vector<double> result;
  for (const NullVector& vector : vectors_) {
    double sum = 0.0;
    for (std::size_t l = 0; l < vector.value.size(); ++l) sum += vector.value[l] * x[vector.first + l * vector.stride];
    result.push_back(sum);
  }
  return result;
}

// Solutions are C^- b + V a + C^- A c, V the null vectors of C, one for each dropped row. With P = A'V and S = A'C^-A,
// c in the complement Q of the range of P, the constraint is [P SQ] (a, c) = -A'C^- b, and the determinant of C on the
// vectors that obey it is that of the accepted pivots times |P'P| |Q'SQ|.
void Constraint::prepare(Equations& equations) {
  if (empty()) return;
  order_ = at(equations.order());
  const auto order = static_cast<Eigen::Index>(order_);
  const auto count = static_cast<Eigen::Index>(vectors_.size());
  Eigen::MatrixXd a = Eigen::MatrixXd::Zero(order, count);
  for (Eigen::Index v = 0; v < count; ++v) {
    const NullVector& vector = vectors_[at(v)];
    for (std::size_t l = 0; l < vector.value.size(); ++l) {
      a(static_cast<Eigen::Index>(vector.first + l * vector.stride), v) = vector.value[l];
    }
  }
  const auto products_with = [&](const Eigen::MatrixXd& x) {
    Eigen::MatrixXd result(count, x.cols());
    for (Eigen::Index j = 0; j < x.cols(); ++j) {
      const std::vector<double> column = products({x.col(j).data(), order_});
      result.col(j) = Eigen::Map<const Eigen::VectorXd>(column.data(), count);
    }
    return result;
  };
  const Eigen::MatrixXd inverse = solved(equations, a);
  const Eigen::MatrixXd between = products_with(inverse);
  const Eigen::MatrixXd null = null_vectors(equations);
  const Eigen::MatrixXd p = products_with(null);

  Eigen::MatrixXd complement = Eigen::MatrixXd::Identity(count, count);
  if (p.cols() > 0) complement = p.householderQr().householderQ() * complement;
  const Eigen::MatrixXd q = complement.rightCols(count - p.cols());
  Eigen::MatrixXd moves(order, count);
  moves << null, inverse * q;
  Eigen::MatrixXd across(count, count);
  across << p, between * q;
  const Eigen::MatrixXd shift = moves * across.inverse();
  log_det_ = log_abs_det(p.transpose() * p) + log_abs_det(q.transpose() * between * q);
  shift_.assign(shift.data(), shift.data() + shift.size());
  inverse_.assign(inverse.data(), inverse.data() + inverse.size());
  between_.assign(between.data(), between.data() + between.size());
}

void Constraint::apply(std::span<double> solutions) const {
  if (empty()) return;
  for (std::size_t first = 0; first < solutions.size(); first += order_) {
    const std::span<double> x = solutions.subspan(first, order_);
    const std::vector<double> product = products(x);
    for (std::size_t v = 0; v < product.size(); ++v) {
      for (std::size_t i = 0; i < order_; ++i) x[i] -= shift_[v * order_ + i] * product[v];
    }
  }
}

void Constraint::apply_transposed(std::span<double> right) const {
  if (empty()) return;
  for (std::size_t first = 0; first < right.size(); first += order_) {
    std::vector<double> products;
    for (std::size_t v = 0; v < vectors_.size(); ++v) {
      double sum = 0.0;
      for (std::size_t i = 0; i < order_; ++i) sum += shift_[v * order_ + i] * right[first + i];
      products.push_back(sum);
    }
    for (std::size_t v = 0; v < vectors_.size(); ++v) {
      const NullVector& vector = vectors_[v];
      for (std::size_t l = 0; l < vector.value.size(); ++l) {
        right[first + vector.first + l * vector.stride] -= vector.value[l] * products[v];
      }
    }
  }
}

double Constraint::covariance(std::size_t i, std::size_t j) const {
  double sum = 0.0;
  const std::size_t count = vectors_.size();
  for (std::size_t v = 0; v < count; ++v) {
    sum -= shift_[v * order_ + i] * inverse_[v * order_ + j] + inverse_[v * order_ + i] * shift_[v * order_ + j];
    for (std::size_t u = 0; u < count; ++u) {
      sum += shift_[v * order_ + i] * between_[u * count + v] * shift_[u * order_ + j];
    }
  }
  return sum;
}

}  // namespace sm::mixed
