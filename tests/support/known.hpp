// Matrices that are known element by element, with what is stored and what is not: random ones of every shape, what the
// module's matrices hold, and plain sums and products in double, in which infinities and NaNs show as they must.
#pragma once

#include "support/matrices.hpp"
#include "support/random_matrices.hpp"

namespace sm::test {

// A matrix element by element: what is stored, both triangles of a symmetric one, and with which value.
class Known {
 public:
  Known() = default;
  Known(std::int64_t rows, std::int64_t cols)
      : rows_(rows), cols_(cols), v_(at(rows * cols)), stored_(at(rows * cols)) {}
  // Of a symmetric matrix the elements of the upper triangle.
  Known(Shape shape, std::int64_t rows, std::int64_t cols, const Nonzeros& elements);
  // Everything stored.
  static Known full(const std::vector<std::vector<double>>& rows);

  std::int64_t rows() const { return rows_; }
  std::int64_t cols() const { return cols_; }
  void set(std::int64_t r, std::int64_t c, double value) {
    v_[at(r * cols_ + c)] = value;
    stored_[at(r * cols_ + c)] = true;
  }
  void set_both(std::int64_t r, std::int64_t c, double value) {
    set(r, c, value);
    set(c, r, value);
  }
  bool has(std::int64_t r, std::int64_t c) const { return stored_[at(r * cols_ + c)]; }
  double operator()(std::int64_t r, std::int64_t c) const { return v_[at(r * cols_ + c)]; }  // 0 when not stored
  std::vector<double> row(std::int64_t r) const;
  std::vector<double> by_rows() const { return v_; }
  Dense dense() const;
  std::int64_t count() const;            // stored elements
  Nonzeros elements(Shape shape) const;  // those stored that the shape has a place for

 private:
  std::int64_t rows_ = 0;
  std::int64_t cols_ = 0;
  std::vector<double> v_;
  std::vector<bool> stored_;
};

// Multiples of 1/64. Symmetric and diagonal ones are positive definite, sparse ones have gaps and stored zeros, and a
// general sparse one of more than two rows has an empty row.
Known random_known(Random& random, Shape shape, std::int64_t rows, std::int64_t cols);
// Elements of a and b, where either has one.
Known sum(const Known& a, const Known& b);
// Over stored elements, in the order of the inner index: infinities and NaNs as the storage has them.
Known product(const Known& a, const Known& b);
// Sum of x[i] a(i, j) y[j] over stored elements.
double form(const Known& a, const double* x, const double* y);
Known upper_part(const Known& a);  // the elements on and above the diagonal, mirrored
Known diagonal_part(const Known& a);

// What the matrix stores, open or closed, in any state: without the module's readers.
Known read(SmMatrix* matrix);

// To the bit but for the sign of a zero and the bits of a NaN.
bool same(double got, double want);
::testing::AssertionResult same(const std::vector<double>& got, const std::vector<double>& want);
::testing::AssertionResult same(const Known& got, const Known& want);          // values; what is not stored is 0
::testing::AssertionResult same_entries(const Known& got, const Known& want);  // and stored in the same places

}  // namespace sm::test
