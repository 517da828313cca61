#include "store/store_test.hpp"

#include <cmath>

namespace sm::test {

SmMatrix* StoreTest::reset_record() {
  SmMatrix* matrix = typed(kGeneralRows);
  EXPECT_EQ(fn().qxsmdelete(matrix), SM_OK);
  return matrix;
}

SmMatrix* StoreTest::definite(Shape shape) {
  SmMatrix* m = square(shape, 3);
  const bool off_diagonal = shape.kind != SM_KIND_DIAGONAL;
  EXPECT_EQ(set(m, 0, 0, 4.0), SM_OK);
  EXPECT_EQ(set(m, 1, 1, 3.0), SM_OK);
  EXPECT_EQ(set(m, 2, 2, off_diagonal ? 1.25 : 1.0), SM_OK);
  if (off_diagonal) {
    EXPECT_EQ(set(m, 1, 2, std::sqrt(0.75)), SM_OK);
  }
  EXPECT_EQ(fn().qxsmclose(m, 0.0), SM_OK);
  return m;
}

double StoreTest::at(SmMatrix* m, std::int64_t row, std::int64_t col) {
  double value = -12345.0;
  EXPECT_EQ(fn().qxsmget(m, row, col, &value), SM_OK) << row << ' ' << col;
  return value;
}

SmStatus StoreTest::refused_at(SmMatrix* m, std::int64_t row, std::int64_t col) {
  double value = 0.0;
  const SmStatus status = fn().qxsmget(m, row, col, &value);
  EXPECT_TRUE(is_missing(value)) << row << ' ' << col;
  return status;
}

}  // namespace sm::test
