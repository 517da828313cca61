#include "dense_oracle.hpp"

#include <Eigen/Dense>
#include <cmath>

namespace sm::mixed::test {
namespace {

const Real kLog2Pi = std::log(2.0L * std::acos(-1.0L));

Eigen::Index index(std::size_t i) { return static_cast<Eigen::Index>(i); }

MatrixL moore_penrose(const Precision& precision) {
  MatrixL dense = MatrixL::Zero(precision.order, precision.order);
  for (Eigen::Index i = 0; i < precision.order; ++i) {
    for (auto p = precision.row_start[std::size_t(i)]; p < precision.row_start[std::size_t(i) + 1]; ++p) {
      const Eigen::Index j = precision.col[std::size_t(p)];
      dense(i, j) = dense(j, i) = precision.value[std::size_t(p)];
    }
  }
  const Eigen::SelfAdjointEigenSolver<MatrixL> eigen(dense);
  VectorL inverse = eigen.eigenvalues().cwiseInverse();
  inverse.head(precision.nullity).setZero();
  return eigen.eigenvectors() * inverse.asDiagonal() * eigen.eigenvectors().transpose();
}

MatrixL kronecker(const MatrixL& a, const MatrixL& b) {
  MatrixL result(a.rows() * b.rows(), a.cols() * b.cols());
  for (Eigen::Index i = 0; i < a.rows(); ++i) {
    for (Eigen::Index j = 0; j < a.cols(); ++j)
      result.block(i * b.rows(), j * b.cols(), b.rows(), b.cols()) = a(i, j) * b;
  }
  return result;
}

Real log_det(const Eigen::LDLT<MatrixL>& ldlt) { return ldlt.vectorD().array().log().sum(); }

}  // namespace

MatrixL inverse_of(const MatrixL& matrix) { return matrix.inverse(); }

Real log_det(const MatrixL& positive) { return log_det(Eigen::LDLT<MatrixL>(positive)); }

DenseOracle::DenseOracle(const Model& model) {
  const Eigen::Index n = model.rows();
  y_ = Eigen::Map<const Eigen::VectorXd>(model.y.data(), n).cast<Real>();
  MatrixL all = MatrixL::Zero(n, model.fixed.x.cols());
  for (Eigen::Index j = 0; j < all.cols(); ++j) {
    for (auto p = model.fixed.x.start[std::size_t(j)]; p < model.fixed.x.start[std::size_t(j) + 1]; ++p) {
      all(model.fixed.x.row[std::size_t(p)], j) = model.fixed.x.value[std::size_t(p)];
    }
  }
  x_.resize(n, model.fixed.rank());
  for (std::size_t j = 0; j < model.fixed.kept.size(); ++j) x_.col(index(j)) = all.col(model.fixed.kept[j]);
  for (const RandomTerm& term : model.random) {
    const Eigen::Index k = term.coef_count();
    MatrixL z = MatrixL::Zero(n, k * term.level_count());
    for (Eigen::Index i = 0; i < n; ++i) {
      for (Eigen::Index c = 0; c < k; ++c) z(i, term.level[std::size_t(i)] * k + c) = term.z[std::size_t(i * k + c)];
    }
    const MatrixL relation = term.precision ? moore_penrose(*term.precision)
                                            : MatrixL(MatrixL::Identity(term.level_count(), term.level_count()));
    for (Eigen::Index b = 0; b < k; ++b) {
      for (Eigen::Index a = b; a < k; ++a) {
        MatrixL unit = MatrixL::Zero(k, k);
        unit(a, b) = unit(b, a) = 1.0L;
        derivatives_.push_back(z * kronecker(relation, unit) * z.transpose());
      }
    }
    coefs_.push_back(k);
    z_.push_back(std::move(z));
    relation_.push_back(relation);
  }
  VectorL noise = VectorL::Ones(n);
  if (!model.weights.empty())
    noise = Eigen::Map<const Eigen::VectorXd>(model.weights.data(), n).cast<Real>().cwiseInverse();
  derivatives_.push_back(noise.asDiagonal());
}

MatrixL DenseOracle::variance(const VectorL& parameters) const {
  MatrixL v = MatrixL::Zero(y_.size(), y_.size());
  for (std::size_t i = 0; i < derivatives_.size(); ++i) v += parameters(index(i)) * derivatives_[i];
  return v;
}

MatrixL DenseOracle::level_covariance(const VectorL& parameters, std::size_t t) const {
  Eigen::Index first = 0;
  for (std::size_t s = 0; s < t; ++s) first += coefs_[s] * (coefs_[s] + 1) / 2;
  MatrixL covariance(coefs_[t], coefs_[t]);
  for (Eigen::Index b = 0; b < coefs_[t]; ++b) {
    for (Eigen::Index a = b; a < coefs_[t]; ++a) covariance(a, b) = covariance(b, a) = parameters(first++);
  }
  return covariance;
}

MatrixL DenseOracle::effect_covariance(const VectorL& parameters, std::size_t t) const {
  return kronecker(relation_[t], level_covariance(parameters, t));
}

Real DenseOracle::criterion(const VectorL& parameters, bool reml) const {
  const Eigen::LDLT<MatrixL> v(variance(parameters));
  const MatrixL vx = v.solve(x_);
  const Eigen::LDLT<MatrixL> xvx(x_.transpose() * vx);
  const VectorL residual = y_ - x_ * xvx.solve(vx.transpose() * y_);
  Real value = log_det(v) + residual.dot(v.solve(residual));
  value += static_cast<Real>(y_.size() - (reml ? x_.cols() : 0)) * kLog2Pi;
  if (reml && x_.cols() > 0) value += log_det(xvx);
  return value;
}

DenseOracle::Answer DenseOracle::answer(const VectorL& parameters, bool reml) const {
  Answer a;
  a.v_inverse = variance(parameters).inverse();
  const MatrixL vx = a.v_inverse * x_;
  a.beta_covariance = (x_.transpose() * vx).inverse();
  a.p = a.v_inverse - vx * a.beta_covariance * vx.transpose();
  a.beta = a.beta_covariance * (vx.transpose() * y_);
  a.py = a.p * y_;
  for (std::size_t t = 0; t < z_.size(); ++t) {
    const MatrixL d = effect_covariance(parameters, t);
    const MatrixL zd = z_[t] * d;
    a.random.push_back(zd.transpose() * a.py);
    a.random_covariance.push_back(d - zd.transpose() * a.p * zd);
    a.conditional.push_back(d - zd.transpose() * a.v_inverse * zd);
  }
  const std::size_t count = derivatives_.size();
  a.average.resize(index(count), index(count));
  a.observed = a.expected = a.average;
  std::vector<VectorL> forms;
  std::vector<MatrixL> products;
  for (const MatrixL& derivative : derivatives_) {
    forms.push_back(derivative * a.py);
    products.push_back((reml ? a.p : a.v_inverse) * derivative);
  }
  for (std::size_t i = 0; i < count; ++i) {
    const VectorL projected = a.p * forms[i];
    for (std::size_t j = 0; j < count; ++j) {
      const Real form = projected.dot(forms[j]);
      const Real product = products[i].cwiseProduct(products[j].transpose()).sum();
      a.average(index(i), index(j)) = 0.5L * form;
      a.expected(index(i), index(j)) = 0.5L * product;
      a.observed(index(i), index(j)) = form - 0.5L * product;
    }
  }
  return a;
}

Real DenseOracle::slope(const Answer& a, std::size_t parameter, bool reml) const {
  const MatrixL& derivative = derivatives_[parameter];
  return (reml ? a.p : a.v_inverse).cwiseProduct(derivative).sum() - a.py.dot(derivative * a.py);
}

Real DenseOracle::satterthwaite(const Answer& a, const VectorL& l, const std::vector<std::size_t>& free) const {
  const Real variance = l.dot(a.beta_covariance * l);
  VectorL gradient(index(free.size()));
  MatrixL information(index(free.size()), index(free.size()));
  const VectorL e = a.v_inverse * (x_ * (a.beta_covariance * l));
  for (std::size_t i = 0; i < free.size(); ++i) {
    gradient(index(i)) = e.dot(derivatives_[free[i]] * e);
    for (std::size_t j = 0; j < free.size(); ++j)
      information(index(i), index(j)) = a.observed(index(free[i]), index(free[j]));
  }
  return 2.0L * variance * variance / gradient.dot(information.ldlt().solve(gradient));
}

}  // namespace sm::mixed::test
