// Moving the stored rows into the factor's order, in place, and back into the caller's.
#include "cholesky/reorder.hpp"

#include <algorithm>
#include <bit>
#include <utility>

#include "cholesky/steps.hpp"
#include "store/checks.hpp"

namespace sm {

namespace {

bool has_workspace(const SmMatrix& m, i64 words) { return m.work && m.work_capacity >= words; }

// Gives every entry to the row of whichever index comes first in the order; owner[p] and counts get the result.
void find_owners(SmMatrix& m, i64* counts, i64* owner) {
  std::fill_n(counts, m.rows, 0);
  for (i64 i = 0; i < m.rows; ++i) {
    for (i64 p = m.row_start[i]; p < m.row_start[i + 1]; ++p) {
      const i64 j = m.col_index[p];
      owner[p] = i;
      if (m.inv_perm[j] < m.inv_perm[i]) {
        m.col_index[p] = i;
        owner[p] = j;
      }
      ++counts[owner[p]];
    }
  }
}

void move_row_starts(SmMatrix& m, i64* counts) {
  for (i64 i = 0; i < m.rows; ++i) {
    m.row_start[i + 1] = m.row_start[i] + counts[i];
    counts[i] = m.row_start[i + 1];
  }
}

// Rows fill from their end; the diagonal takes the first slot, where the factorization expects it. The diagonals of one
// row stand together in this walk, so remembering the last row is enough to tell a repeated one.
void find_targets(SmMatrix& m, i64* ends, i64* target) {
  i64 last_diagonal = -1;
  for (i64 p = m.nnz - 1; p >= 0; --p) {
    const i64 row = target[p];  // still the owner
    if (m.col_index[p] == row && row != last_diagonal) {
      target[p] = m.row_start[row];
      last_diagonal = row;
    } else {
      target[p] = --ends[row];
    }
  }
}

void permute_entries(SmMatrix& m, i64* target) {
  for (i64 p = 0; p < m.nnz; ++p) {
    while (target[p] != p) {
      const i64 to = target[p];
      std::swap(m.col_index[p], m.col_index[to]);
      std::swap(m.nz_values[p], m.nz_values[to]);
      target[p] = target[to];
      target[to] = to;
    }
  }
}

Gate may_reorder(const SmMatrix& m) {
  SM_STOP_IF(m.nnz < 1, SM_OK);
  SM_STOP_IF(m.state >= SM_STATE_REORDERED, SM_OK);
  SM_STOP_IF(m.kind == SM_KIND_NONE, SM_UNTYPED);
  SM_STOP_IF(m.state != SM_STATE_ORDERED, SM_WRONG_STATE);
  SM_STOP_IF(!is_symmetric_sparse(m) || !is_closed(m) || !has_workspace(m, m.rows + m.nnz), SM_WRONG_STATE);
  return {};
}

// Counts in start[k + 1], then offsets: start[k] is where bucket k begins.
void to_offsets(i64* start, i64 buckets) {
  for (i64 k = 0; k < buckets; ++k) start[k + 1] += start[k];
}

}  // namespace

SmStatus reorder(SmMatrix& m) {
  SM_PASS(may_reorder(m));
  i64* counts = m.work;
  i64* target = m.work + m.rows;
  find_owners(m, counts, target);
  move_row_starts(m, counts);
  find_targets(m, counts, target);
  permute_entries(m, target);
  m.state = SM_STATE_REORDERED;
  return SM_OK;
}

// Two bucket sorts, by column and then, keeping that order, by row.
void restore_order(SmMatrix& m) {
  const i64 n = m.rows;
  if (!m.row_start || !has_workspace(m, n + 1 + 3 * m.nnz)) return;
  m.factor_scratch = m.factor_iju = m.factor_iu = m.factor_ju = nullptr;
  m.factor_diag = m.factor_values = nullptr;
  i64* start = m.work;
  i64* row = start + n + 1;
  i64* col = row + m.nnz;
  i64* value = col + m.nnz;  // bits of the doubles: the workspace is words
  std::fill_n(start, n + 1, 0);
  for (i64 i = 0; i < n; ++i) {
    for (i64 p = m.row_start[i]; p < m.row_start[i + 1]; ++p) ++start[std::max(i, m.col_index[p]) + 1];
  }
  to_offsets(start, n);
  for (i64 i = 0; i < n; ++i) {
    for (i64 p = m.row_start[i]; p < m.row_start[i + 1]; ++p) {
      const i64 slot = start[std::max(i, m.col_index[p])]++;
      row[slot] = std::min(i, m.col_index[p]);
      col[slot] = std::max(i, m.col_index[p]);
      value[slot] = std::bit_cast<i64>(m.nz_values[p]);
    }
  }
  std::fill_n(m.row_start, n + 1, 0);
  for (i64 p = 0; p < m.nnz; ++p) ++m.row_start[row[p] + 1];
  to_offsets(m.row_start, n);
  std::copy_n(m.row_start, n, start);
  for (i64 p = 0; p < m.nnz; ++p) {
    const i64 slot = start[row[p]]++;
    m.col_index[slot] = col[p];
    m.nz_values[slot] = std::bit_cast<double>(value[p]);
  }
}

}  // namespace sm
