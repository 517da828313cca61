// Tail areas and quantiles that the output of a fit needs.
#pragma once

namespace sm::mixed {

// P(|T| > |t|) of Student's t with df > 0 degrees of freedom, not necessarily whole; relative accuracy about 1e-12.
// Infinite df is the normal distribution. NaN when t or df is one, or when df <= 0.
double student_two_sided(double t, double df);

// The standard normal quantile of p in (0, 1); infinite at the ends, NaN outside.
double normal_quantile(double p);

}  // namespace sm::mixed
