// Products and forms, behind the C boundary.
#pragma once

#include "frame/core.hpp"

namespace sm {

// Indices first .. last, both included.
struct Range {
  i64 first;
  i64 last;

  bool has(i64 k) const { return first <= k && k <= last; }
  bool is_within(i64 n) const { return 0 <= first && first <= last && last < n; }
  i64 size() const { return last - first + 1; }
};

// What a matrix multiplies and what it makes of it: vectors one after the other.
struct Block {
  const double* x;
  double* y;
  i64 count;
  bool accumulate;
};

[[nodiscard]] SmStatus multiply(SmMatrix& a, const Block& block, Range rows, Range cols);
[[nodiscard]] SmStatus multiply_transposed(SmMatrix& a, const Block& block);

[[nodiscard]] SmStatus form_of_vectors(SmMatrix& a, const double* x, double* r, i64 p, Range range);
[[nodiscard]] SmStatus bilinear_form(SmMatrix& a, const double* x, const double* y, double* r, i64 p, i64 q);
[[nodiscard]] SmStatus form_of_matrix(SmMatrix& a, SmMatrix& x, SmMatrix& r, bool keep);
[[nodiscard]] SmStatus form_around_array(SmMatrix& g, const double* s, SmMatrix& r, bool keep);

[[nodiscard]] SmStatus inverse_form_of_vectors(SmMatrix& a, const double* x, double* r, i64 p, std::int32_t format);
[[nodiscard]] SmStatus inverse_form_of_matrix(SmMatrix& a, SmMatrix& x, SmMatrix& r);
[[nodiscard]] SmStatus inverse_bilinear_form(SmMatrix& a, const double* x, const double* y, double* r, i64 p, i64 q);

[[nodiscard]] SmStatus scale(SmMatrix& a, double s);
[[nodiscard]] SmStatus multiply_matrices(SmMatrix& a, SmMatrix& b, SmMatrix& c, bool keep);

}  // namespace sm
