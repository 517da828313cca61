// The one place where the tests compile a decomposition of matrices in double precision.
#pragma once

#include <Eigen/Core>

namespace sm::mixed::test {

Eigen::VectorXd eigenvalues_of(const Eigen::MatrixXd& symmetric);  // ascending

}  // namespace sm::mixed::test
