// Checks and bookkeeping that many operations share.
#pragma once

#include <cstdint>

#include "frame/memory.hpp"
#include "store/layouts.hpp"

namespace sm {

// Readable: closed, and a symmetric sparse matrix has its compressed rows (a refused resize leaves state 1 without).
inline bool is_closed(const SmMatrix& m) {
  return m.state >= SM_STATE_CLOSED && !(is_symmetric_sparse(m) && !m.row_start);
}

// What most operations ask first of the matrix they read, in this order: nothing stored is nothing to do, a record of
// kind none answers 1, an open matrix 113.
inline Gate may_read(const SmMatrix& m) {
  SM_STOP_IF(m.nnz < 1, SM_OK);
  SM_STOP_IF(m.kind == SM_KIND_NONE, SM_UNTYPED);
  SM_STOP_IF(!is_closed(m), SM_NOT_CLOSED);
  return {};
}

// What was computed from the entries is no longer known.
inline void void_results(SmMatrix& m) {
  // Entered elements void them time and again, and a look costs less than a store.
  if (m.rank != 0) m.rank = 0;
  if (std::bit_cast<std::uint64_t>(m.log_det) != SM_MISSING_BITS) m.log_det = missing();
}

// Whether an array of nnz elements at `p` shares any with the value array of the compressed rows, wherever it begins.
inline bool overlaps_nz_values(const SmMatrix& m, const double* p) {
  const auto given = reinterpret_cast<std::uintptr_t>(p);
  const auto own = reinterpret_cast<std::uintptr_t>(m.nz_values);
  return (given < own ? own - given : given - own) < static_cast<std::uintptr_t>(m.nnz) * sizeof(double);
}

// Entries of a matrix with a value array are about to change: a separate factor or inverse no longer belongs to them.
// One that replaced the values themselves stays, with its state.
inline void drop_separate_factor(SmMatrix& m) {
  if (!m.dense_factor) return;
  give_back(m.pool, m.dense_factor);
  if (m.state >= SM_STATE_FACTORED) m.state = SM_STATE_CLOSED;
}

}  // namespace sm
