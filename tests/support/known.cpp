#include "support/known.hpp"

#include <cmath>

namespace sm::test {

namespace {

Known random_general(Random& random, bool sparse, std::int64_t rows, std::int64_t cols) {
  Known k(rows, cols);
  const std::int64_t gap = rows > 2 ? rows / 2 : -1;
  for (std::int64_t r = 0; r < rows; ++r)
    for (std::int64_t c = 0; c < cols; ++c) {
      if (sparse && (r == gap || random.chance(50))) continue;
      k.set(r, c, random.chance(10) ? 0.0 : random.dyadic());
    }
  if (sparse && k.count() == 0) k.set(0, cols - 1, random.dyadic());
  return k;
}

// Diagonally dominant.
Known random_symmetric(Random& random, Shape shape, std::int64_t n) {
  Known k(n, n);
  for (std::int64_t r = 0; r < n; ++r)
    for (std::int64_t c = r + 1; c < n; ++c) {
      if (shape.kind == SM_KIND_DIAGONAL || (is_sparse(shape) && random.chance(50))) continue;
      k.set_both(r, c, random.chance(10) ? 0.0 : random.dyadic());
    }
  for (std::int64_t r = 0; r < n; ++r) {
    double d = 1.0 + std::fabs(random.dyadic());
    for (std::int64_t c = 0; c < n; ++c) d += std::fabs(k(r, c));
    k.set(r, r, d);
  }
  return k;
}

::testing::AssertionResult compare(const Known& got, const Known& want, bool places) {
  if (got.rows() != want.rows() || got.cols() != want.cols()) {
    return ::testing::AssertionFailure() << got.rows() << " x " << got.cols() << " instead of " << want.rows() << " x "
                                         << want.cols();
  }
  for (std::int64_t r = 0; r < got.rows(); ++r)
    for (std::int64_t c = 0; c < got.cols(); ++c) {
      if (!same(got(r, c), want(r, c))) {
        return ::testing::AssertionFailure()
               << "element (" << r << ", " << c << ") is " << got(r, c) << " instead of " << want(r, c);
      }
      if (places && got.has(r, c) != want.has(r, c)) {
        return ::testing::AssertionFailure()
               << "element (" << r << ", " << c << ") is " << (got.has(r, c) ? "" : "not ") << "stored";
      }
    }
  return ::testing::AssertionSuccess();
}

}  // namespace

Known::Known(Shape shape, std::int64_t rows, std::int64_t cols, const Nonzeros& elements) : Known(rows, cols) {
  for (const auto& [place, value] : elements) {
    set(place.first, place.second, value);
    if (shape.kind == SM_KIND_SYMMETRIC) set(place.second, place.first, value);
  }
}

Known Known::full(const std::vector<std::vector<double>>& rows) {
  Known k(static_cast<std::int64_t>(rows.size()), static_cast<std::int64_t>(rows.at(0).size()));
  for (std::int64_t r = 0; r < k.rows_; ++r)
    for (std::int64_t c = 0; c < k.cols_; ++c) k.set(r, c, rows[at(r)][at(c)]);
  return k;
}

std::vector<double> Known::row(std::int64_t r) const {
  const auto begin = v_.begin() + r * cols_;
  return {begin, begin + cols_};
}

Dense Known::dense() const {
  Dense d(rows_, cols_);
  for (std::int64_t r = 0; r < rows_; ++r)
    for (std::int64_t c = 0; c < cols_; ++c) d(r, c) = (*this)(r, c);
  return d;
}

std::int64_t Known::count() const {
  std::int64_t n = 0;
  for (const bool s : stored_) n += s ? 1 : 0;
  return n;
}

Nonzeros Known::elements(Shape shape) const {
  Nonzeros out;
  for (std::int64_t r = 0; r < rows_; ++r)
    for (std::int64_t c = 0; c < cols_; ++c)
      if (has(r, c) && has_place(shape, r, c)) out[{r, c}] = (*this)(r, c);
  return out;
}

Known random_known(Random& random, Shape shape, std::int64_t rows, std::int64_t cols) {
  if (shape.kind == SM_KIND_GENERAL) return random_general(random, is_sparse(shape), rows, cols);
  return random_symmetric(random, shape, rows);
}

Known sum(const Known& a, const Known& b) {
  Known s(a.rows(), a.cols());
  for (std::int64_t r = 0; r < a.rows(); ++r)
    for (std::int64_t c = 0; c < a.cols(); ++c)
      if (a.has(r, c) || b.has(r, c)) s.set(r, c, a(r, c) + b(r, c));
  return s;
}

Known product(const Known& a, const Known& b) {
  Known p(a.rows(), b.cols());
  for (std::int64_t i = 0; i < a.rows(); ++i)
    for (std::int64_t k = 0; k < a.cols(); ++k)
      for (std::int64_t j = 0; j < b.cols(); ++j)
        if (a.has(i, k) && b.has(k, j)) p.set(i, j, p(i, j) + a(i, k) * b(k, j));
  return p;
}

double form(const Known& a, const double* x, const double* y) {
  double s = 0.0;
  for (std::int64_t i = 0; i < a.rows(); ++i)
    for (std::int64_t j = 0; j < a.cols(); ++j)
      if (a.has(i, j)) s += x[i] * a(i, j) * y[j];
  return s;
}

Known upper_part(const Known& a) {
  Known u(a.rows(), a.cols());
  for (std::int64_t r = 0; r < a.rows(); ++r)
    for (std::int64_t c = r; c < a.cols(); ++c)
      if (a.has(r, c)) u.set_both(r, c, a(r, c));
  return u;
}

Known diagonal_part(const Known& a) {
  Known d(a.rows(), a.cols());
  for (std::int64_t r = 0; r < a.rows() && r < a.cols(); ++r)
    if (a.has(r, r)) d.set(r, r, a(r, r));
  return d;
}

Known read(SmMatrix* matrix) {
  if (matrix->nnz < 1) return {matrix->rows, matrix->cols};
  return {shape_of(matrix), matrix->rows, matrix->cols, entries(matrix)};
}

bool same(double got, double want) { return got == want || (std::isnan(got) && std::isnan(want)); }

::testing::AssertionResult same(const std::vector<double>& got, const std::vector<double>& want) {
  if (got.size() != want.size()) {
    return ::testing::AssertionFailure() << got.size() << " values instead of " << want.size();
  }
  for (std::size_t i = 0; i < got.size(); ++i)
    if (!same(got[i], want[i])) {
      return ::testing::AssertionFailure() << "value " << i << " is " << got[i] << " instead of " << want[i];
    }
  return ::testing::AssertionSuccess();
}

::testing::AssertionResult same(const Known& got, const Known& want) { return compare(got, want, false); }
::testing::AssertionResult same_entries(const Known& got, const Known& want) { return compare(got, want, true); }

}  // namespace sm::test
