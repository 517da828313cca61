// Matrices filled from seeds or given elements, together with what they hold.
#pragma once

#include "support/known.hpp"
#include "support/output.hpp"

namespace sm::test {

struct Filled {
  Shape shape;
  SmMatrix* matrix;
  Dense dense;      // every element, both triangles
  Nonzeros stored;  // what the matrix has a place for; of a symmetric one the upper triangle
};

// Closed, never without entries: a random_known matrix.
Filled filled(Session& session, Shape shape, std::int64_t rows, std::int64_t cols, Random& random);
// The same, symmetric or diagonal, which makes it positive definite.
Filled filled_definite(Session& session, Shape shape, std::int64_t n, Random& random);
// Closed, from given elements; only places with one are entered into a sparse matrix.
Filled filled_with(Session& session, Shape shape, std::int64_t rows, std::int64_t cols, const Nonzeros& elements);

// Row `row` from column `start` on, with the blocks that by-rows storage of a general matrix and by-columns storage of
// a symmetric one move to the beginning.
std::vector<double> row_from(Shape shape, const Dense& a, std::int64_t row, std::int64_t start);

}  // namespace sm::test
