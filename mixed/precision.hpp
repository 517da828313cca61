// Precisions that are given as a matrix: inverses of relationship matrices, structure matrices of Gaussian fields.
#pragma once

#include <cstdint>
#include <string>
#include <vector>

#include "mixed/error.hpp"
#include "mixed/model.hpp"
#include "mixed/module.hpp"

namespace sm::mixed {

// What was read is no precision: a numerical answer rather than a slip in writing it.
class NotSemidefinite : public ModelError {
 public:
  using ModelError::ModelError;
};

// How the messages name a matrix.
struct MatrixNames {
  std::string file;
  std::vector<std::string> ids;  // of its rows
};

// A precision from the whole matrix, both triangles, rows ascending in each column. Factors it in the module for its
// rank, and finds what spans its null space. Throws ModelError when it is not square and symmetric, and
// NotSemidefinite.
//
// A row d that the factor drops is a combination of the accepted rows S, so that x with x_d = 1, x_S = -K_SS^-1 K_Sd
// and zeros in the other dropped places is a null vector. With these in B, the product of the nonzero eigenvalues is
// |K_SS| |B'B|.
Precision matrix_precision(const Module& module, const SparseColumns& k, const MatrixNames& names);

}  // namespace sm::mixed
