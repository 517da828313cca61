#include "support/dense_reference.hpp"

#include <Eigen/LU>
#include <algorithm>
#include <cmath>

namespace sm::test {

namespace {

using EigenMatrix = Eigen::Matrix<long double, Eigen::Dynamic, Eigen::Dynamic>;

EigenMatrix eigen_of(const Dense& a) {
  EigenMatrix e(a.rows(), a.cols());
  for (std::int64_t r = 0; r < a.rows(); ++r)
    for (std::int64_t c = 0; c < a.cols(); ++c) e(r, c) = a(r, c);
  return e;
}

}  // namespace

Dense identity(std::int64_t n) {
  Dense a(n, n);
  for (std::int64_t i = 0; i < n; ++i) a(i, i) = 1.0L;
  return a;
}

Dense from_rows(const std::vector<std::vector<double>>& rows) {
  Dense a(static_cast<std::int64_t>(rows.size()), rows.empty() ? 0 : static_cast<std::int64_t>(rows[0].size()));
  for (std::int64_t r = 0; r < a.rows(); ++r)
    for (std::int64_t c = 0; c < a.cols(); ++c)
      a(r, c) = rows[static_cast<std::size_t>(r)][static_cast<std::size_t>(c)];
  return a;
}

Dense from_diagonal(const std::vector<double>& d) {
  Dense a(static_cast<std::int64_t>(d.size()), static_cast<std::int64_t>(d.size()));
  for (std::int64_t i = 0; i < a.rows(); ++i) a(i, i) = d[static_cast<std::size_t>(i)];
  return a;
}

Dense transposed(const Dense& a) {
  Dense t(a.cols(), a.rows());
  for (std::int64_t r = 0; r < a.rows(); ++r)
    for (std::int64_t c = 0; c < a.cols(); ++c) t(c, r) = a(r, c);
  return t;
}

Dense product(const Dense& a, const Dense& b) {
  Dense p(a.rows(), b.cols());
  for (std::int64_t i = 0; i < a.rows(); ++i)
    for (std::int64_t k = 0; k < a.cols(); ++k)
      for (std::int64_t j = 0; j < b.cols(); ++j) p(i, j) += a(i, k) * b(k, j);
  return p;
}

Dense reordered(const Dense& a, const std::vector<std::int64_t>& perm) {
  const auto n = static_cast<std::int64_t>(perm.size());
  Dense p(n, n);
  for (std::int64_t i = 0; i < n; ++i)
    for (std::int64_t j = 0; j < n; ++j)
      p(i, j) = a(perm[static_cast<std::size_t>(i)], perm[static_cast<std::size_t>(j)]);
  return p;
}

Dense trailing(const Dense& a, std::int64_t from) {
  Dense t(a.rows() - from, a.cols() - from);
  for (std::int64_t r = 0; r < t.rows(); ++r)
    for (std::int64_t c = 0; c < t.cols(); ++c) t(r, c) = a(from + r, from + c);
  return t;
}

Dense scaled(const Dense& a, long double s) {
  Dense b(a.rows(), a.cols());
  for (std::int64_t r = 0; r < a.rows(); ++r)
    for (std::int64_t c = 0; c < a.cols(); ++c) b(r, c) = s * a(r, c);
  return b;
}

Dense sum(const Dense& a, const Dense& b) {
  Dense t(a.rows(), a.cols());
  for (std::int64_t r = 0; r < a.rows(); ++r)
    for (std::int64_t c = 0; c < a.cols(); ++c) t(r, c) = a(r, c) + b(r, c);
  return t;
}

Dense principal(const Dense& a, const std::vector<bool>& keep) {
  std::vector<std::int64_t> kept;
  for (std::size_t i = 0; i < keep.size(); ++i)
    if (keep[i]) kept.push_back(static_cast<std::int64_t>(i));
  return reordered(a, kept);
}

std::vector<double> product(const Dense& a, const std::vector<double>& x) {
  std::vector<double> y;
  for (std::int64_t i = 0; i < a.rows(); ++i) {
    long double s = 0.0L;
    for (std::int64_t j = 0; j < a.cols(); ++j) s += a(i, j) * x[static_cast<std::size_t>(j)];
    y.push_back(static_cast<double>(s));
  }
  return y;
}

Dense columns(const std::vector<double>& x, std::int64_t n) {
  const std::int64_t count = n == 0 ? 0 : static_cast<std::int64_t>(x.size()) / n;
  Dense a(n, count);
  for (std::int64_t c = 0; c < count; ++c)
    for (std::int64_t r = 0; r < n; ++r) a(r, c) = x[static_cast<std::size_t>(c * n + r)];
  return a;
}

std::vector<double> row_major(const Dense& a) {
  std::vector<double> v;
  for (std::int64_t r = 0; r < a.rows(); ++r)
    for (std::int64_t c = 0; c < a.cols(); ++c) v.push_back(static_cast<double>(a(r, c)));
  return v;
}

DenseFactor factor_with_drops(const Dense& a, double tolerance) {
  const std::int64_t n = a.rows();
  DenseFactor f{identity(n), std::vector<long double>(static_cast<std::size_t>(n), 0.0L),
                std::vector<bool>(static_cast<std::size_t>(n), false)};
  Dense s = a;  // the Schur complement of the accepted pivots
  for (std::int64_t k = 0; k < n; ++k) {
    const long double d = s(k, k);
    const long double limit = std::fabs(a(k, k)) * tolerance;
    if (!(d > limit)) {
      if (d < (limit < 0.1L ? -0.1L : -100.0L * limit)) {
        f.definite = false;
        return f;
      }
      continue;
    }
    f.d[static_cast<std::size_t>(k)] = d;
    f.accepted[static_cast<std::size_t>(k)] = true;
    ++f.rank;
    f.log_det += std::log(d);
    for (std::int64_t j = k + 1; j < n; ++j) f.u(k, j) = s(k, j) / d;
    for (std::int64_t i = k + 1; i < n; ++i)
      for (std::int64_t j = k + 1; j < n; ++j) s(i, j) -= f.u(k, i) * s(k, j);
  }
  return f;
}

long double log_determinant(const Dense& a) {
  if (a.rows() == 0) return 0.0L;
  const Eigen::PartialPivLU<EigenMatrix> lu(eigen_of(a));
  long double sum = 0.0L;
  for (std::int64_t i = 0; i < a.rows(); ++i) sum += std::log(std::fabs(lu.matrixLU()(i, i)));
  return sum;
}

std::int64_t rank_by_full_pivoting(const Dense& a) {
  if (a.rows() == 0) return 0;
  Eigen::FullPivLU<EigenMatrix> lu(eigen_of(a));
  lu.setThreshold(1e-10L);
  return lu.rank();
}

Dense inverse(const Dense& a) {
  Dense inv(a.rows(), a.rows());
  if (a.rows() == 0) return inv;
  const EigenMatrix e = eigen_of(a).inverse();
  for (std::int64_t r = 0; r < a.rows(); ++r)
    for (std::int64_t c = 0; c < a.rows(); ++c) inv(r, c) = e(r, c);
  return inv;
}

long double largest(const Dense& a) {
  long double most = 0.0L;
  for (std::int64_t r = 0; r < a.rows(); ++r)
    for (std::int64_t c = 0; c < a.cols(); ++c)
      if (!(std::fabs(a(r, c)) <= most)) most = std::fabs(a(r, c));
  return most;
}

::testing::AssertionResult near(const Dense& got, const Dense& want, double tolerance) {
  if (got.rows() != want.rows() || got.cols() != want.cols()) {
    return ::testing::AssertionFailure() << got.rows() << " x " << got.cols() << " instead of " << want.rows() << " x "
                                         << want.cols();
  }
  const long double bound = static_cast<long double>(tolerance) * std::max(1.0L, largest(want));
  for (std::int64_t r = 0; r < got.rows(); ++r)
    for (std::int64_t c = 0; c < got.cols(); ++c)
      if (!(std::fabs(got(r, c) - want(r, c)) <= bound)) {
        return ::testing::AssertionFailure()
               << "element (" << r << ", " << c << ") is " << got(r, c) << " instead of " << want(r, c);
      }
  return ::testing::AssertionSuccess();
}

::testing::AssertionResult near(const std::vector<double>& got, const std::vector<double>& want, double tolerance) {
  return near(columns(got, static_cast<std::int64_t>(got.size())),
              columns(want, static_cast<std::int64_t>(want.size())), tolerance);
}

}  // namespace sm::test
