// What the suites of the matrix store share: records in every stage of life, and elements as the module tells them.
#pragma once

#include "support/matrices.hpp"

namespace sm::test {

class StoreTest : public ModuleTest {
 protected:
  SmMatrix* make(Shape shape, std::int64_t rows, std::int64_t cols) {
    return ModuleTest::make(shape.kind, shape.format, rows, cols);
  }
  SmMatrix* square(Shape shape, std::int64_t n) { return make(shape, n, n); }
  // A record of that type without a size.
  SmMatrix* typed(Shape shape) { return new_typed(session(), shape); }
  // A record that was typed and reset.
  SmMatrix* reset_record();
  // A positive definite matrix, closed, with log-determinant log 12: diagonal (4, 3, 1) and, where the shape holds one,
  // an element (1, 2) whose elimination costs the last pivot 0.25: the diagonal there is 1.25 and (1, 2) is sqrt(0.75).
  SmMatrix* definite(Shape shape);

  SmStatus set(SmMatrix* m, std::int64_t row, std::int64_t col, double value) {
    return fn().qxsmassign(m, row, col, 0, value);
  }
  SmStatus add(SmMatrix* m, std::int64_t row, std::int64_t col, double value) {
    return fn().qxsmassign(m, row, col, 1, value);
  }
  // The element as qxsmget tells it; fails the test when the status is not 0.
  double at(SmMatrix* m, std::int64_t row, std::int64_t col);
  // The status of qxsmget, whose value must be the missing one.
  SmStatus refused_at(SmMatrix* m, std::int64_t row, std::int64_t col);
};

}  // namespace sm::test
