#include "iterative/conjugate_gradients_reference.hpp"

namespace sm::test {

namespace {

using Vector = std::vector<long double>;

Vector times(const Dense& a, const Vector& x) {
  Vector y(at(a.rows()), 0.0L);
  for (std::int64_t i = 0; i < a.rows(); ++i)
    for (std::int64_t j = 0; j < a.cols(); ++j) y[at(i)] += a(i, j) * x[at(j)];
  return y;
}

long double dot(const Vector& x, const Vector& y) {
  long double s = 0.0L;
  for (std::size_t i = 0; i < x.size(); ++i) s += x[i] * y[i];
  return s;
}

}  // namespace

Recurrence conjugate_gradients(const Dense& a, const std::vector<double>& b, std::int64_t steps) {
  const std::size_t n = b.size();
  Vector r(b.begin(), b.end());
  Vector x(n, 0.0L);
  Vector z(n);
  const auto precondition = [&] {
    for (std::size_t i = 0; i < n; ++i) {
      const long double d = a(static_cast<std::int64_t>(i), static_cast<std::int64_t>(i));
      z[i] = d > 0.0L ? r[i] / d : 0.0L;
    }
  };
  precondition();
  Vector p = z;
  Recurrence result{{dot(r, z)}, {}};
  for (std::int64_t k = 0; k < steps; ++k) {
    const long double rho = result.rho.back();
    const Vector q = times(a, p);
    const long double alpha = rho / dot(p, q);
    for (std::size_t i = 0; i < n; ++i) x[i] += alpha * p[i];
    for (std::size_t i = 0; i < n; ++i) r[i] -= alpha * q[i];
    precondition();
    const long double next = dot(r, z);
    for (std::size_t i = 0; i < n; ++i) p[i] = z[i] + next / rho * p[i];
    result.rho.push_back(next);
    result.iterates.emplace_back(x.begin(), x.end());
  }
  return result;
}

Solved solve(SmMatrix* matrix, const std::vector<double>& b, const Limits& limits) {
  Solved s;
  s.x.assign(b.size() + 1, kUntouched);
  s.status = matrix->instance->functions->qxsmsolioc(matrix, b.data(), s.x.data(), limits.nrhs, limits.max_iterations,
                                                     &s.iterations, &s.residual, limits.tolerance);
  EXPECT_EQ(s.x.back(), kUntouched);
  s.x.pop_back();
  return s;
}

std::int32_t Recorder::record(void* context, double rho, std::int64_t user_word, std::int64_t iteration) {
  auto* self = static_cast<Recorder*>(context);
  self->steps.push_back({rho, user_word, iteration});
  return iteration == self->stop_at ? self->answer : 0;
}

Dense ill_conditioned(std::int64_t n, double condition) {
  // Q D Q for a reflection Q = I - 2vv'/v'v and D from 1 to `condition` in equal ratios.
  const Random seed(5);
  Random random = seed;
  const std::vector<double> v = random.vector(n);
  Dense q = identity(n);
  long double length = 0.0L;
  for (const double e : v) length += static_cast<long double>(e) * e;
  for (std::int64_t i = 0; i < n; ++i)
    for (std::int64_t j = 0; j < n; ++j) q(i, j) -= 2.0L * v[at(i)] * v[at(j)] / length;
  Dense d(n, n);
  for (std::int64_t i = 0; i < n; ++i)
    d(i, i) = std::pow(static_cast<long double>(condition),
                       n > 1 ? static_cast<long double>(i) / static_cast<long double>(n - 1) : 0.0L);
  const Dense exact = product(product(q, d), q);
  Dense rounded(n, n);
  for (std::int64_t i = 0; i < n; ++i)
    for (std::int64_t j = i; j < n; ++j) rounded(i, j) = rounded(j, i) = static_cast<double>(exact(i, j));
  return rounded;
}

}  // namespace sm::test
