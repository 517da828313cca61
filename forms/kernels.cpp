#include "forms/kernels.hpp"

#include <algorithm>
#include <climits>
#include <cmath>

#include "forms/lanes.hpp"

extern "C" {
double ddot_(const int* n, const double* x, const int* incx, const double* y, const int* incy);
void daxpy_(const int* n, const double* a, const double* x, const int* incx, double* y, const int* incy);
}

namespace sm {

namespace {

constexpr std::int32_t kLongSum = 250;
constexpr i64 kLongDot = 500;
constexpr i64 kLongest = INT_MAX;  // what a BLAS counts
constexpr int kUnit = 1;

double blas_dot(const double* x, const double* y, i64 n) {
  const int length = static_cast<int>(std::min(n, kLongest));
  return ddot_(&length, x, &kUnit, y, &kUnit);
}

}  // namespace

void hzvaxpy(double* z, const double* x, const double* y, std::int32_t n, double a) {
  if (n >= kLongSum && z == x) {
    daxpy_(&n, &a, y, &kUnit, z, &kUnit);
    return;
  }
  for (std::int32_t i = 0; i < n; ++i) z[i] = x[i] + a * y[i];
}

void add_multiple(double* z, const double* y, i64 n, double a) {
  if (n < kLongSum) {
    hzvaxpy(z, z, y, static_cast<std::int32_t>(std::max(n, i64{0})), a);
    return;
  }
  for (i64 done = 0; done < n; done += kLongest) {
    const int length = static_cast<int>(std::min(n - done, kLongest));
    daxpy_(&length, &a, y + done, &kUnit, z + done, &kUnit);
  }
}

double hzvdot11(const double* x, const double* y, i64 n) {
  if (n < kLongDot) return lane_dot(x, y, n);
  double sum = blas_dot(x, y, n);
  for (i64 done = kLongest; done < n; done += kLongest) sum += blas_dot(x + done, y + done, n - done);
  return sum;
}

double zvamx(const double* x, i64 n) {
  if (n < 1) return 0.0;
  double largest = std::fabs(x[0]);
  for (i64 i = 1; i < n; ++i) {
    const double magnitude = std::fabs(x[i]);
    largest = magnitude < largest ? largest : magnitude;
  }
  return largest;
}

}  // namespace sm
