// Moving the stored rows into the factor's order, in place, and back into the caller's.
#include "cholesky/reorder.hpp"

#include <algorithm>
#include <cstdint>
#include <utility>

#include "cholesky/steps.hpp"
#include "store/checks.hpp"

namespace sm {

namespace {

constexpr i64 kLongRow = 64;

bool has_workspace(const SmMatrix& m, i64 words) { return m.work && m.work_capacity >= words; }

// Gives every entry to the row of whichever index comes first in the order; owner[p] and counts get the result. In a
// short row, which comes first cannot be foretold, so there is no jump: the sign of a difference makes a mask.
template <class Index>
void find_owners(SmMatrix& m, Index* counts, Index* owner) {
  std::fill_n(counts, m.rows, Index{0});
  for (i64 i = 0; i < m.rows; ++i) {
    const i64 place = m.inv_perm[i];
    const i64 end = m.row_start[i + 1];
    const bool is_short = end - m.row_start[i] < kLongRow;
    for (i64 p = m.row_start[i]; p < end; ++p) {
      const i64 j = m.col_index[p];
      if (is_short) {
        const i64 exchange = (i ^ j) & ((m.inv_perm[j] - place) >> 63);
        owner[p] = static_cast<Index>(i ^ exchange);
        m.col_index[p] = j ^ exchange;
        ++counts[i ^ exchange];
      } else if (m.inv_perm[j] < place) {
        owner[p] = static_cast<Index>(j);
        m.col_index[p] = i;
        ++counts[j];
      } else {
        owner[p] = static_cast<Index>(i);
        ++counts[i];
      }
    }
  }
}

template <class Index>
void move_row_starts(SmMatrix& m, Index* counts) {
  for (i64 i = 0; i < m.rows; ++i) {
    m.row_start[i + 1] = m.row_start[i] + counts[i];
    counts[i] = static_cast<Index>(m.row_start[i + 1]);
  }
}

// Rows fill from their end; the diagonal takes the first slot, where the factorization expects it. The diagonals of one
// row stand together in this walk, so remembering the last row is enough to tell a repeated one. visit(p, where entry p
// belongs).
template <class Index>
void for_each_target(const SmMatrix& m, Index* ends, const Index* owner, auto&& visit) {
  i64 last_diagonal = -1;
  for (i64 p = m.nnz - 1; p >= 0; --p) {
    const i64 row = static_cast<i64>(owner[p]);
    if (m.col_index[p] == row && row != last_diagonal) {
      last_diagonal = row;
      visit(p, m.row_start[row]);
    } else {
      visit(p, static_cast<i64>(--ends[row]));
    }
  }
}

template <class Index>
void permute_entries(SmMatrix& m, Index* target) {
  for (i64 p = 0; p < m.nnz; ++p) {
    while (static_cast<i64>(target[p]) != p) {
      const i64 to = static_cast<i64>(target[p]);
      std::swap(m.col_index[p], m.col_index[to]);
      std::swap(m.nz_values[p], m.nz_values[to]);
      target[p] = target[to];
      target[to] = static_cast<Index>(to);
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

// visit(position, smaller index, larger index) of every stored entry.
void for_each_entry(const SmMatrix& m, auto&& visit) {
  for (i64 i = 0; i < m.rows; ++i) {
    for (i64 p = m.row_start[i]; p < m.row_start[i + 1]; ++p) {
      visit(p, std::min(i, m.col_index[p]), std::max(i, m.col_index[p]));
    }
  }
}

// Through copies where the workspace has room for them: along cycles each entry waits for the memory of the one before.
template <class Index>
void move_entries(SmMatrix& m, Index* ends, Index* owner) {
  const i64 used = m.rows + m.nnz;
  if (!has_workspace(m, used + 2 * m.nnz)) {
    for_each_target(m, ends, owner, [&](i64 p, i64 target) { owner[p] = static_cast<Index>(target); });
    permute_entries(m, owner);
    return;
  }
  i64* column = m.work + used;
  auto* value = reinterpret_cast<double*>(column + m.nnz);
  for_each_target(m, ends, owner, [&](i64 p, i64 target) {
    column[target] = m.col_index[p];
    value[target] = m.nz_values[p];
  });
  std::copy_n(column, m.nnz, m.col_index);
  std::copy_n(value, m.nnz, m.nz_values);
}

// Whatever the rows look like.
template <class Index>
void reorder_by_owners(SmMatrix& m) {
  auto* counts = reinterpret_cast<Index*>(m.work);
  Index* owner = counts + m.rows;
  find_owners(m, counts, owner);
  move_row_starts(m, counts);
  move_entries(m, counts, owner);
}

}  // namespace

void reorder_rows(SmMatrix& m, IndexWidth width) {
  width == IndexWidth::half ? reorder_by_owners<std::uint32_t>(m) : reorder_by_owners<i64>(m);
}

SmStatus reorder(SmMatrix& m) {
  SM_PASS(may_reorder(m));
  give_back(m.pool, m.factor_reserved);  // the places that a refill found in an earlier order
  if (!reorder_border(m)) reorder_rows(m, width_for<std::uint32_t>(m.nnz));  // each row has an entry
  m.state = SM_STATE_REORDERED;
  return SM_OK;
}

// Closing left the upper triangle row by row, columns ascending: two bucket sorts of the positions, by larger and then,
// keeping that order, by smaller index.
void find_closing_places(const SmMatrix& m, i64* place, i64* scratch) {
  const i64 n = m.rows;
  i64* start = scratch;
  i64* by_column = scratch + n + 1;
  i64* row = by_column + m.nnz;
  std::fill_n(start, n + 1, 0);
  for_each_entry(m, [&](i64, i64, i64 larger) { ++start[larger + 1]; });
  to_offsets(start, n);
  for_each_entry(m, [&](i64 p, i64 smaller, i64 larger) {
    const i64 slot = start[larger]++;
    by_column[slot] = p;
    row[slot] = smaller;
  });
  std::fill_n(start, n + 1, 0);
  for (i64 s = 0; s < m.nnz; ++s) ++start[row[s] + 1];
  to_offsets(start, n);
  for (i64 s = 0; s < m.nnz; ++s) place[by_column[s]] = start[row[s]]++;
}

SmStatus need_closing_places(SmMatrix& m) {
  if (m.factor_reserved) return SM_OK;
  SM_TRY(need_pool(m));
  Scratch<i64> place;
  Scratch<i64> scratch;
  SM_TRY(place.take(m.pool, m.nnz));
  SM_TRY(scratch.take(m.pool, closing_places_scratch(m)));
  find_closing_places(m, place.data(), scratch.data());
  m.factor_reserved = place.release();
  return SM_OK;
}

void restore_order(SmMatrix& m) {
  const i64 n = m.rows;
  if (!m.row_start || !has_workspace(m, m.nnz + closing_places_scratch(m))) return;
  m.factor_scratch = m.factor_iju = m.factor_iu = m.factor_ju = nullptr;
  m.factor_diag = m.factor_values = nullptr;
  i64* place = m.work;
  i64* start = place + m.nnz;
  find_closing_places(m, place, start);
  std::fill_n(start, n + 1, 0);
  for_each_entry(m, [&](i64 p, i64 smaller, i64 larger) {
    ++start[smaller + 1];
    m.col_index[p] = larger;
  });
  to_offsets(start, n);
  std::copy_n(start, n + 1, m.row_start);
  permute_entries(m, place);
}

}  // namespace sm
