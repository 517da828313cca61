// Vector kernels on contiguous arrays. Short vectors, the usual case of sparse work, stay in loops of their own; long
// ones go to the BLAS, and their last bits then depend on it.
#pragma once

#include "frame/core.hpp"

namespace sm {

// z <- x + a y, n elements; z may be x, other overlaps are not served. From 250 elements on with z == x, daxpy: it
// updates in place only, so a third array stays in the loop here, however long it is.
void hzvaxpy(double* z, const double* x, const double* y, std::int32_t n, double a);

// z += a y for any n: hzvaxpy in place, in pieces when there are more elements than it can count.
void add_multiple(double* z, const double* y, i64 n, double a);

// Sum of x[i] y[i]; from 500 elements on, ddot, in pieces when there are more than it can count.
double hzvdot11(const double* x, const double* y, i64 n);

// Largest |x[i]|; 0.0 when n < 1. Whatever is not smaller than the largest so far takes its place, a NaN included, and
// whatever follows a NaN takes that one's: with NaNs in x it is the largest after the last one, or that NaN.
double zvamx(const double* x, i64 n);

}  // namespace sm
