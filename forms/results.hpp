// What forms and products of matrices share: sizes, contiguous rows, and ways into a result matrix.
#pragma once

#include <algorithm>
#include <cmath>

#include "store/checks.hpp"
#include "store/operations.hpp"
#include "store/views.hpp"

namespace sm {

inline bool is_general_dense(const SmMatrix& m) { return m.kind == SM_KIND_GENERAL && is_dense_format(m.format); }

// Elements of a p x q array, and of a packed triangle of order n; 105 above 2^53.
[[nodiscard]] inline SmStatus array_size(i64 p, i64 q, i64& count) {
  if (static_cast<double>(p) * static_cast<double>(q) > static_cast<double>(SM_MAX_ELEMENTS)) return SM_TOO_LARGE;
  count = p * q;
  return SM_OK;
}
[[nodiscard]] inline SmStatus packed_size(i64 n, i64& count) {
  const double exact = static_cast<double>(n) * (static_cast<double>(n) + 1.0) / 2.0;
  if (exact > static_cast<double>(SM_MAX_ELEMENTS)) return SM_TOO_LARGE;
  count = n * (n + 1) / 2;
  return SM_OK;
}

// The rows of a general dense matrix one after the other: its own array where they stand like that already, else a
// copy.
class ContiguousRows {
 public:
  [[nodiscard]] SmStatus take(MemoryPool* pool, SmMatrix& m) {
    const FullArray array(m);
    data_ = array.values;
    if (array.layout.col_step == 1) return SM_OK;
    i64 count = 0;
    SM_TRY(array_size(m.rows, m.cols, count));
    SM_TRY(copy_.take(pool, count));
    array.entries([&](i64 i, i64 j, double v) { copy_.data()[i * m.cols + j] = v; });
    data_ = copy_.data();
    return SM_OK;
  }
  const double* data() const { return data_; }

 private:
  Scratch<double> copy_;
  const double* data_ = nullptr;
};

// The value array of a symmetric or diagonal matrix of order n, about to be written as a whole: its factor and what was
// computed from its entries go. 121 when there is no array of that order.
[[nodiscard]] inline SmStatus claim_values(SmMatrix& m, i64 n, double*& values) {
  i64 count = n;
  if (m.kind == SM_KIND_SYMMETRIC) SM_TRY(packed_size(n, count));
  if (m.rows != n || m.nnz != count || !m.values) return SM_DIMENSION_MISMATCH;
  give_back(m.pool, m.dense_factor);
  if (m.state >= SM_STATE_FACTORED) m.state = SM_STATE_CLOSED;
  void_results(m);
  values = m.values;
  return SM_OK;
}

// Adds the elements of a packed triangle by columns whose magnitude is above the tolerance to a symmetric matrix.
[[nodiscard]] inline SmStatus enter_packed(const double* packed, i64 n, double tolerance, SmMatrix& r) {
  for (i64 b = 0; b < n; ++b) {
    for (i64 a = 0; a <= b; ++a, ++packed) {
      if (std::fabs(*packed) > tolerance) SM_TRY(assign(r, a, b, true, *packed));
    }
  }
  return SM_OK;
}

// The default tolerance of entries.
inline double entry_tolerance(const SmMatrix& m) { return m.instance->tolerances[3]; }

// The answer of resizing a result is not asked for, so that an operation goes on with what the result holds. Only where
// an element finds no place there is it told, when memory was the cause.
[[nodiscard]] inline SmStatus or_why_unsized(SmStatus written, SmStatus sized) {
  const bool has_no_place = written == SM_BAD_ARGUMENT || written == SM_DIMENSION_MISMATCH;
  return has_no_place && (sized == SM_NO_MEMORY || sized == SM_TOO_LARGE) ? sized : written;
}

}  // namespace sm
