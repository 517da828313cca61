// Substitution with the packed factor R of a symmetric matrix, R'R = A.
#pragma once

#include <type_traits>

#include "forms/kernels.hpp"
#include "store/layouts.hpp"

namespace sm {

// A packed triangle R is stored in contiguous segments: by columns, segment k is R(0..k, k), by rows R(k, k..n-1). The
// off-diagonal part of a segment either gives to component k (gather) or takes from it (scatter); R' and R swap roles.
struct Segment {
  const double* off;  // the entries off the diagonal
  i64 first;          // the component that off[0] belongs to
  i64 count;
  double diagonal;
};

inline Segment segment(const PackedColumns& layout, const double* r, i64 k) {
  return {r + layout.at(0, k), 0, k, r[layout.diagonal(k)]};
}
inline Segment segment(const PackedRows& layout, const double* r, i64 k) {
  return {r + layout.diagonal(k) + 1, k + 1, layout.n - 1 - k, r[layout.diagonal(k)]};
}

// A dropped pivot passes its component on undivided.
inline double divide(double y, double pivot) { return pivot > 0.0 ? y / pivot : y; }

inline void gather(const Segment& s, double* y, i64 k) {
  y[k] = divide(y[k] - hzvdot11(s.off, y + s.first, s.count), s.diagonal);
}

inline void scatter(const Segment& s, double* y, i64 k) {
  y[k] = divide(y[k], s.diagonal);
  hzvaxpy(y + s.first, y + s.first, s.off, static_cast<std::int32_t>(s.count), -y[k]);
}

// y <- R'^- y.
template <class Layout>
void solve_transposed(const Layout& layout, const double* r, double* y) {
  constexpr bool kByColumns = std::is_same_v<Layout, PackedColumns>;
  for (i64 k = 0; k < layout.n; ++k) {
    kByColumns ? gather(segment(layout, r, k), y, k) : scatter(segment(layout, r, k), y, k);
  }
}

// y <- R^- y for a y whose components behind `last` are 0; they are neither read nor written.
template <class Layout>
void solve_upper(const Layout& layout, const double* r, double* y, i64 last) {
  constexpr bool kByColumns = std::is_same_v<Layout, PackedColumns>;
  for (i64 k = last; k >= 0; --k) {
    Segment s = segment(layout, r, k);
    if (!kByColumns) s.count = last - k;
    kByColumns ? scatter(s, y, k) : gather(s, y, k);
  }
}

}  // namespace sm
