// Symbolic factorization: the structure of U in compressed subscripts.
//
// Method: Eisenstat, Gursky, Schultz, Sherman, "Yale Sparse Matrix Package I: the symmetric codes", Int. J. Numer.
// Methods Eng. 18 (1982) 1145-1151; compressed subscripts: A. H. Sherman, "On the efficient solution of sparse systems
// of linear and nonlinear equations", thesis, Yale University (1975).
//
// Row k of U is its own entries joined with the tails of the earlier rows whose first column is k; those rows are
// chained from jl[k]. Workspace, in words: iju [0, n), iu [n, 2n], jl [2n+1, 3n+1), ju from 3n+1; and at the top, while
// this runs, mark [C-2n, C-n) and the merge list q [C-n, C).
#include <algorithm>
#include <cmath>

#include "cholesky/steps.hpp"
#include "store/checks.hpp"

namespace sm {

namespace {

constexpr i64 kAbsent = -1;  // not on the merge list

class SymbolicRows {
 public:
  explicit SymbolicRows(const SmMatrix& m)
      : m_(m),
        n_(m.rows),
        room_(m.work_capacity - 5 * n_ - 1),
        iju_(m.work),
        iu_(m.work + n_),
        jl_(m.work + 2 * n_ + 1),
        ju_(m.work + 3 * n_ + 1),
        mark_(m.work + m.work_capacity - 2 * n_),
        q_(m.work + m.work_capacity - n_) {}

  // 0, 106, or 105 when the subscripts do not fit: shortfall() words are missing then.
  SmStatus run();
  i64 shortfall() const { return juptr_ + 1 - room_; }

 private:
  SmStatus row(i64 k);
  SmStatus own_entries(i64 k, bool& is_tail);
  void sort_list();
  i64 merge_lists(i64 first, i64 second);
  void merge_row(i64 i);
  bool store_list(i64 k);
  bool found_in_last_block(i64 k);
  void clear_list();
  i64 length(i64 i) const { return iu_[i + 1] - iu_[i]; }

  const SmMatrix& m_;
  i64 n_;
  i64 room_;  // slots of ju
  i64 *iju_, *iu_, *jl_, *ju_, *mark_, *q_;
  i64 juptr_ = -1;  // last slot used
  i64 jumin_ = 0;   // first slot of the last block
  i64 head_ = 0;    // first column of the merge list; q_[c] follows column c; n_ ends it
  i64 luk_ = 0;     // its length
};

// Entries of row k in the new order, unsorted. is_tail: every one of them is in the block that k's mark names.
SmStatus SymbolicRows::own_entries(i64 k, bool& is_tail) {
  const i64 row = m_.perm[k];
  const i64 tag = mark_[k];
  for (i64 p = m_.row_start[row]; p < m_.row_start[row + 1]; ++p) {
    const i64 c = m_.inv_perm[m_.col_index[p]];
    if (c <= k) continue;
    if (q_[c] != kAbsent) return SM_SYMBOLIC_FAILED;
    q_[c] = head_;
    head_ = c;
    ++luk_;
    if (mark_[c] != tag) is_tail = false;
  }
  return SM_OK;
}

i64 SymbolicRows::merge_lists(i64 first, i64 second) {
  i64 head = n_;
  i64* link = &head;
  while (first < n_ && second < n_) {
    i64& smaller = first < second ? first : second;
    *link = smaller;
    link = &q_[smaller];
    smaller = *link;
  }
  *link = first < n_ ? first : second;
  return head;
}

// Merge sort of the list: bins[b] holds a sorted run of 2^b columns. A row with very many entries stays cheap.
void SymbolicRows::sort_list() {
  constexpr int kBins = 54;
  i64 bins[kBins];
  int used = 0;
  i64 rest = head_;
  while (rest < n_) {
    i64 run = rest;
    rest = q_[rest];
    q_[run] = n_;
    int b = 0;
    for (; b < used && bins[b] < n_; ++b) {
      run = merge_lists(bins[b], run);
      bins[b] = n_;
    }
    bins[b] = run;
    used = std::max(used, b + 1);
  }
  head_ = n_;
  for (int b = 0; b < used; ++b) head_ = merge_lists(head_, bins[b]);
}

// Joins the columns of row i after its first one into the list.
void SymbolicRows::merge_row(i64 i) {
  i64* link = &head_;
  const i64* column = ju_ + iju_[i];
  for (i64 t = 1; t < length(i); ++t) {
    const i64 c = column[t];
    while (*link < c) link = &q_[*link];
    if (*link != c) {
      q_[c] = *link;
      *link = c;
      ++luk_;
    }
    link = &q_[c];
  }
}

// Looks for the list in the last block of subscripts. True when all of it is there; when the block ends first, the new
// block may start inside it.
bool SymbolicRows::found_in_last_block(i64 k) {
  const i64* first = ju_ + jumin_;
  const i64* last = ju_ + juptr_ + 1;
  const i64* hit = std::lower_bound(first, last, head_);
  if (hit == last || *hit != head_) return false;
  i64 c = head_;
  const i64* slot = hit;
  for (; slot != last && c == *slot; ++slot) c = q_[c];
  if (c >= n_) {
    iju_[k] = hit - ju_;
    return true;
  }
  if (slot == last) juptr_ = hit - ju_ - 1;
  return false;
}

// Puts the list into ju. False when there is no room.
bool SymbolicRows::store_list(i64 k) {
  if (found_in_last_block(k)) return true;
  jumin_ = juptr_ + 1;
  juptr_ += luk_;
  if (juptr_ >= room_) return false;
  i64 slot = jumin_;
  for (i64 c = head_; c < n_; c = q_[c]) {
    ju_[slot++] = c;
    mark_[c] = k;
  }
  iju_[k] = jumin_;
  return true;
}

void SymbolicRows::clear_list() {
  while (head_ < n_) {
    const i64 c = head_;
    head_ = q_[c];
    q_[c] = kAbsent;
  }
  luk_ = 0;
}

SmStatus SymbolicRows::row(i64 k) {
  const i64 updating = jl_[k];
  bool is_tail = updating >= 0 && jl_[updating] < 0;
  SM_TRY(own_entries(k, is_tail));
  i64 count = 0;
  if (is_tail) {
    iju_[k] = iju_[updating] + 1;
    count = length(updating) - 1;
  } else {
    sort_list();
    iju_[k] = juptr_;
    i64 longest = 0;
    for (i64 i = updating; i >= 0; i = jl_[i]) {
      merge_row(i);
      if (length(i) - 1 > longest) {
        longest = length(i) - 1;
        iju_[k] = iju_[i] + 1;
      }
    }
    if (luk_ != longest && !store_list(k)) return SM_TOO_LARGE;
    count = luk_;
  }
  clear_list();
  if (count > 1) {
    const i64 first = ju_[iju_[k]];
    jl_[k] = jl_[first];
    jl_[first] = k;
  }
  iu_[k + 1] = iu_[k] + count;
  return SM_OK;
}

SmStatus SymbolicRows::run() {
  if (room_ < 0) return SM_TOO_LARGE;  // not even mark and q fit
  std::fill_n(mark_, n_, -1);
  std::fill_n(jl_, n_, -1);
  std::fill_n(q_, n_, kAbsent);
  iu_[0] = 0;
  head_ = n_;
  for (i64 k = 0; k < n_; ++k) SM_TRY(row(k));
  return SM_OK;
}

// A workspace of `words` more, with the first `keep` words of the old one.
SmStatus extend_workspace(SmMatrix& m, i64 words, i64 keep) {
  if ((static_cast<double>(m.work_capacity) + static_cast<double>(words)) * 8.0 > std::ldexp(1.0, 64)) {
    return SM_TOO_LARGE;
  }
  i64* larger = nullptr;
  SM_TRY(allocate(m.pool, m.work_capacity + words, Fill::none, larger));
  std::copy_n(m.work, keep, larger);
  give_back(m.pool, m.work);
  m.work = larger;
  m.work_capacity += words;
  return SM_OK;
}

SmStatus find_structure(SmMatrix& m) {
  for (;;) {
    SymbolicRows rows(m);
    const SmStatus status = rows.run();
    if (status != SM_TOO_LARGE) return status;
    SM_TRY(extend_workspace(m, rows.shortfall(), 0));
  }
}

// Room for n positions, n reciprocal pivots and the values of U behind the integers.
SmStatus make_room_for_values(SmMatrix& m) {
  const i64 n = m.rows;
  const i64 integers = 3 * n + 1 + m.work[n - 1];
  const i64 available = (m.work_capacity - 2 * n) - (integers + m.factor_block) / m.factor_block;
  const i64 values = m.work[2 * n];
  return values <= available ? SM_OK : extend_workspace(m, values - available, m.work_capacity);
}

Gate may_find_structure(const SmMatrix& m) {
  SM_STOP_IF(m.nnz < 1, SM_OK);
  SM_STOP_IF(m.state == SM_STATE_SYMBOLIC, SM_OK);
  SM_STOP_IF(m.kind == SM_KIND_NONE, SM_UNTYPED);
  SM_STOP_IF(!is_closed(m), SM_NOT_CLOSED);
  SM_STOP_IF(m.state >= SM_STATE_FACTORED, SM_OK);
  SM_STOP_IF(m.state != SM_STATE_REORDERED || !is_symmetric_sparse(m) || !m.work, SM_WRONG_STATE);
  return {};
}

}  // namespace

SmStatus factor_symbolic(SmMatrix& m) {
  SM_PASS(may_find_structure(m));
  SM_TRY(find_structure(m));
  SM_TRY(make_room_for_values(m));
  m.factor_iju = m.work;
  m.factor_iu = m.work + m.rows;
  m.factor_ju = m.work + 3 * m.rows + 1;
  m.state = SM_STATE_SYMBOLIC;
  return SM_OK;
}

}  // namespace sm
