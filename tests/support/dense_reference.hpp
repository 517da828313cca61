// Dense matrices in long double, and the plain dense computations that the module's answers are held against.
#pragma once

#include <gtest/gtest.h>

#include <cstddef>
#include <cstdint>
#include <vector>

namespace sm::test {

class Dense {
 public:
  Dense() = default;
  Dense(std::int64_t rows, std::int64_t cols)
      : rows_(rows), cols_(cols), v_(static_cast<std::size_t>(rows * cols), 0.0L) {}

  std::int64_t rows() const { return rows_; }
  std::int64_t cols() const { return cols_; }
  long double& operator()(std::int64_t r, std::int64_t c) { return v_[static_cast<std::size_t>(r * cols_ + c)]; }
  long double operator()(std::int64_t r, std::int64_t c) const { return v_[static_cast<std::size_t>(r * cols_ + c)]; }

 private:
  std::int64_t rows_ = 0;
  std::int64_t cols_ = 0;
  std::vector<long double> v_;
};

Dense identity(std::int64_t n);
Dense from_rows(const std::vector<std::vector<double>>& rows);
Dense from_diagonal(const std::vector<double>& d);
Dense transposed(const Dense& a);
Dense product(const Dense& a, const Dense& b);
// Row and column k of the answer are row and column perm[k] of a.
Dense reordered(const Dense& a, const std::vector<std::int64_t>& perm);
// Row and column `from` and what follows.
Dense trailing(const Dense& a, std::int64_t from);
Dense scaled(const Dense& a, long double s);
Dense sum(const Dense& a, const Dense& b);
// The rows and columns whose flag is set.
Dense principal(const Dense& a, const std::vector<bool>& keep);
std::vector<double> product(const Dense& a, const std::vector<double>& x);
// The n x k matrix whose columns lie one after the other in x.
Dense columns(const std::vector<double>& x, std::int64_t n);
// Element by element, row by row.
std::vector<double> row_major(const Dense& a);

// A = U'DU in the order given, unit upper triangular U. A dropped pivot has d = 0, and the rest of its row of U is 0.
struct DenseFactor {
  Dense u;
  std::vector<long double> d;
  std::vector<bool> accepted;
  std::int64_t rank = 0;
  long double log_det = 0.0L;
  bool definite = true;  // false: a pivot met the negative limit, and the rest is not filled
};
// The rule of the pivots: d > |a| * tolerance is accepted, d below the negative limit ends it, the rest is dropped.
DenseFactor factor_with_drops(const Dense& a, double tolerance);

// Independent of the above (Eigen): log |det A|, the rank by full pivoting, and the inverse.
long double log_determinant(const Dense& a);
std::int64_t rank_by_full_pivoting(const Dense& a);
Dense inverse(const Dense& a);

long double largest(const Dense& a);  // the largest magnitude, NaN when there is one

// Each element apart: |got - want| <= tolerance * max(1, largest magnitude of want). A NaN fails.
::testing::AssertionResult near(const Dense& got, const Dense& want, double tolerance);
inline ::testing::AssertionResult same(const Dense& got, const Dense& want) { return near(got, want, 0.0); }
::testing::AssertionResult near(const std::vector<double>& got, const std::vector<double>& want, double tolerance);

}  // namespace sm::test
