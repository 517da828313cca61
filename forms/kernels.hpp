// Vector kernels on contiguous arrays. Short vectors, the usual case of sparse work, stay in loops of their own; long ones
// go to the BLAS, and their last bits then depend on it.
#pragma once

#include "frame/core.hpp"

namespace sm {

// z <- x + a y, n elements; z may be x. From 250 elements on with z == x, daxpy.
void hzvaxpy(double* z, const double* x, const double* y, std::int32_t n, double a);

// Sum of x[i] y[i]; from 500 elements on, ddot.
double hzvdot11(const double* x, const double* y, i64 n);

}  // namespace sm
