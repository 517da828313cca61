// Matrices filled from seeds together with what they hold, their storage read without the module, and output arrays that
// notice a write outside them.
#pragma once

#include <cstdint>
#include <vector>

#include "store/store_test.hpp"
#include "support/random_matrices.hpp"

namespace sm::test {

struct Filled {
  Shape shape;
  SmMatrix* matrix;
  Dense dense;      // every element, both triangles
  Nonzeros stored;  // what the matrix has a place for; of a symmetric one the upper triangle
};

// Typed and sized; fails the test when it cannot be.
SmMatrix* sized(Session& session, Shape shape, std::int64_t rows, std::int64_t cols);
// Closed, of multiples of 1/64, never without entries. A sparse matrix is given about half of its places (a symmetric one
// its diagonal too), and some of what it is given is an exact zero.
Filled filled(Session& session, Shape shape, std::int64_t rows, std::int64_t cols, Random& random);
// The same, symmetric or diagonal and positive definite.
Filled filled_definite(Session& session, Shape shape, std::int64_t n, Random& random);
// The same from given elements; only places with one are entered into a sparse matrix.
Filled filled_with(Session& session, Shape shape, std::int64_t rows, std::int64_t cols, const Nonzeros& elements);

// A 3 x 3 matrix of the shape with entries that nobody has closed. A general sparse one comes to that by hand only.
struct Unclosed {
  SmMatrix* matrix = nullptr;
  std::vector<double> data;  // what a dense one is tied to
};
Unclosed unclosed(Session& session, Shape shape);
// Closed by its state, but without compressed rows: what a refused resize leaves of an open symmetric sparse matrix.
SmMatrix* without_rows(Session& session, std::int64_t n);
// Of kind none. With `entries` it claims to hold some, which only a record that was tampered with does.
SmMatrix* untyped(Session& session, bool entries = false);

// What a matrix stores, read from its arrays or trees (sparse: in the caller's order, open or closed).
Nonzeros contents(SmMatrix* matrix);
// As a full matrix, both triangles.
Dense dense_contents(SmMatrix* matrix);
// Element by element, row-major.
std::vector<double> row_major(const Dense& a);
::testing::AssertionResult same(const Dense& got, const Dense& want);

// Row `row` from column `start` on, with the blocks that by-rows storage of a general matrix and by-columns storage of a
// symmetric one move to the beginning.
std::vector<double> row_from(Shape shape, const Dense& a, std::int64_t row, std::int64_t start);

// n doubles that are all a mark, between guards; a guard that was written to fails the test.
class Output {
 public:
  explicit Output(std::int64_t n);
  ~Output();
  Output(const Output&) = delete;
  Output& operator=(const Output&) = delete;

  double* data() { return words_.data() + kGuard; }
  std::vector<double> values() const { return {words_.begin() + kGuard, words_.end() - kGuard}; }
  bool untouched() const;
  bool cleared() const;

 private:
  static constexpr std::ptrdiff_t kGuard = 4;
  std::vector<double> words_;
};

}  // namespace sm::test
