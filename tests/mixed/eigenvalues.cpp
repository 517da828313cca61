#include "mixed/eigenvalues.hpp"

#include <Eigen/Eigenvalues>

namespace sm::mixed::test {

Eigen::VectorXd eigenvalues_of(const Eigen::MatrixXd& symmetric) {
  return Eigen::SelfAdjointEigenSolver<Eigen::MatrixXd>(symmetric, Eigen::EigenvaluesOnly).eigenvalues();
}

}  // namespace sm::mixed::test
