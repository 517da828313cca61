// Checks and bookkeeping that many operations share.
#pragma once

#include "frame/memory.hpp"
#include "store/layouts.hpp"

namespace sm {

// Readable: closed, and a symmetric sparse matrix has its compressed rows (a refused resize leaves state 1 without).
inline bool is_closed(const SmMatrix& m) {
  return m.state >= SM_STATE_CLOSED && !(is_symmetric_sparse(m) && !m.row_start);
}

// What was computed from the entries is no longer known.
inline void void_results(SmMatrix& m) {
  m.rank = 0;
  m.log_det = missing();
}

// Entries of a matrix with a value array are about to change: a separate factor or inverse no longer belongs to them.
// One that replaced the values themselves stays, with its state.
inline void drop_separate_factor(SmMatrix& m) {
  if (!m.dense_factor) return;
  give_back(m.pool, m.dense_factor);
  if (m.state >= SM_STATE_FACTORED) m.state = SM_STATE_CLOSED;
}

}  // namespace sm
