// The same models with dense matrices in extended precision: Var(y) = V is formed, and everything follows from it.
#pragma once

#include <Eigen/Core>
#include <vector>

#include "mixed/model.hpp"

namespace sm::mixed::test {

using Real = long double;
using MatrixL = Eigen::Matrix<Real, Eigen::Dynamic, Eigen::Dynamic>;
using VectorL = Eigen::Matrix<Real, Eigen::Dynamic, 1>;

MatrixL inverse_of(const MatrixL& matrix);
Real log_det(const MatrixL& positive);

class DenseOracle {
 public:
  explicit DenseOracle(const Model& model);

  // Covariances in the order of the variance components: each term's, column-major lower triangle, then the residual.
  std::size_t parameters() const { return derivatives_.size(); }
  std::vector<MatrixL> covariances(const std::vector<double>& parameters) const;  // of a level, term after term

  // -2 log (restricted) likelihood.
  Real criterion(const VectorL& parameters, bool reml) const;

  struct Answer {
    MatrixL v_inverse, p;
    VectorL beta, py;
    MatrixL beta_covariance;
    std::vector<VectorL> random;             // of each term, level-major
    std::vector<MatrixL> random_covariance;  // of u - u^
    std::vector<MatrixL> conditional;        // given beta
    MatrixL average;                         // information
    MatrixL observed;
    MatrixL expected;
  };
  Answer answer(const VectorL& parameters, bool reml) const;
  // Of the criterion along one parameter.
  Real slope(const Answer& answer, std::size_t parameter, bool reml) const;
  Real satterthwaite(const Answer& answer, const VectorL& l, const std::vector<std::size_t>& free) const;

  const MatrixL& x() const { return x_; }  // kept columns
  const MatrixL& z(std::size_t t) const { return z_[t]; }

 private:
  MatrixL variance(const VectorL& parameters) const;
  MatrixL level_covariance(const VectorL& parameters, std::size_t t) const;
  MatrixL effect_covariance(const VectorL& parameters, std::size_t t) const;

  VectorL y_;
  MatrixL x_;
  std::vector<MatrixL> z_;
  std::vector<MatrixL> relation_;  // generalized inverses of the precisions
  std::vector<Eigen::Index> coefs_;
  std::vector<MatrixL> derivatives_;  // of V by each parameter
};

}  // namespace sm::mixed::test
