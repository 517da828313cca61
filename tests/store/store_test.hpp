// What the suites of the matrix store share: every shape a matrix can have, its elements read without the module.
#pragma once

#include <gtest/gtest.h>

#include <cstdint>
#include <limits>
#include <map>
#include <string>
#include <utility>
#include <vector>

#include "support/module_test.hpp"

namespace sm::test {

constexpr std::int64_t kHuge = std::numeric_limits<std::int64_t>::max();
constexpr double kNan = std::numeric_limits<double>::quiet_NaN();
constexpr double kInfinity = std::numeric_limits<double>::infinity();

struct Shape {
  std::int32_t kind;
  std::int32_t format;
};
constexpr Shape kGeneralSparse{SM_KIND_GENERAL, SM_FORMAT_SPARSE};
constexpr Shape kGeneralColumns{SM_KIND_GENERAL, SM_FORMAT_COLUMNS};
constexpr Shape kGeneralRows{SM_KIND_GENERAL, SM_FORMAT_ROWS};
constexpr Shape kSymmetricSparse{SM_KIND_SYMMETRIC, SM_FORMAT_SPARSE};
constexpr Shape kSymmetricColumns{SM_KIND_SYMMETRIC, SM_FORMAT_COLUMNS};
constexpr Shape kSymmetricRows{SM_KIND_SYMMETRIC, SM_FORMAT_ROWS};
constexpr Shape kDiagonalColumns{SM_KIND_DIAGONAL, SM_FORMAT_COLUMNS};
constexpr Shape kDiagonalRows{SM_KIND_DIAGONAL, SM_FORMAT_ROWS};
inline constexpr Shape kDense[] = {kGeneralColumns, kGeneralRows,     kSymmetricColumns,
                                   kSymmetricRows,  kDiagonalColumns, kDiagonalRows};
inline constexpr Shape kPacked[] = {kSymmetricColumns, kSymmetricRows};
inline constexpr Shape kSquareFactored[] = {kSymmetricColumns, kSymmetricRows, kDiagonalColumns, kDiagonalRows};
inline constexpr Shape kShapes[] = {kGeneralSparse,    kGeneralColumns, kGeneralRows,     kSymmetricSparse,
                                    kSymmetricColumns, kSymmetricRows,  kDiagonalColumns, kDiagonalRows};
std::string name_of(Shape shape);
bool is_sparse(Shape shape);

// (row, col) -> value of what a sparse matrix stores.
using Nonzeros = std::map<std::pair<std::int64_t, std::int64_t>, double>;

// Value slots of a dense or diagonal shape, counted by laying the elements out one after the other.
std::int64_t slots(Shape shape, std::int64_t rows, std::int64_t cols);
// The slot of an element, found the same way; -1 when the layout has none for it.
std::int64_t slot_of(Shape shape, std::int64_t rows, std::int64_t cols, std::int64_t row, std::int64_t col);

// The rows of a tree matrix, walked from their roots; fails the test when a row does not ascend.
Nonzeros walk(SmMatrix* matrix, std::uint64_t* roots);
// The compressed rows of a closed matrix; fails the test when they break their invariants.
Nonzeros compressed(const SmMatrix* matrix);

std::uint64_t bits(double value);

class StoreTest : public ModuleTest {
 protected:
  SmMatrix* make(Shape shape, std::int64_t rows, std::int64_t cols) {
    return ModuleTest::make(shape.kind, shape.format, rows, cols);
  }
  SmMatrix* square(Shape shape, std::int64_t n) { return make(shape, n, n); }
  // A record of that type without a size.
  SmMatrix* typed(Shape shape);
  // A record that was typed and reset.
  SmMatrix* reset_record();
  // A positive definite matrix, closed, with log-determinant log 12: diagonal (4, 3, 1) and, where the shape holds one, an
  // element (1, 2) whose elimination costs the last pivot 0.25: the diagonal there is 1.25 and (1, 2) is sqrt(0.75).
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

// Expects that rank and log-determinant are those of a matrix whose entries have changed.
void expect_voided(const SmMatrix* m);

}  // namespace sm::test
