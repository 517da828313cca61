// Symbolic factorization: the structure of U in compressed subscripts.
//
// Method: Eisenstat, Gursky, Schultz, Sherman, "Yale Sparse Matrix Package I: the symmetric codes", Int. J. Numer.
// Methods Eng. 18 (1982) 1145-1151; compressed subscripts: A. H. Sherman, "On the efficient solution of sparse systems
// of linear and nonlinear equations", thesis, Yale University (1975).
//
// Row k of U is its own entries joined with the tails of the earlier rows whose first column is k; those rows are
// chained from jl[k]. The longest of the tails is sorted and stored already, so only what is not in it is collected,
// the extras: mostly none. They are searched for in that tail, or flagged against it when they are many. Workspace, in
// words: iju [0, n), iu [n, 2n], jl [2n+1, 3n+1), ju from 3n+1; and at the top, while this runs, two words for each
// column. The words of iu whose rows are still to come hold the columns collected: behind row k there are as many as
// columns.
#include "cholesky/symbolic.hpp"

#include <algorithm>
#include <bit>
#include <cmath>
#include <cstdint>

#include "cholesky/index_width.hpp"
#include "cholesky/lookahead.hpp"
#include "cholesky/rank_sort.hpp"
#include "cholesky/search.hpp"
#include "cholesky/steps.hpp"
#include "store/checks.hpp"

namespace sm {

namespace {

constexpr i64 kSearchGain = 3;  // one search of a tail costs as much as flagging about so many of its columns

constexpr i64 kFewExtras = 12;  // sorted by comparing
constexpr i64 kBitmapGain = 4;  // comparing costs an extra as much as reading about so many words of a bitmap
constexpr i64 kBits = 64;
constexpr i64 kLine = 8;  // words of a line of the cache

constexpr i64 kChainAhead = 8;    // rows between what is fetched of one and its turn
constexpr i64 kNearRows = 40000;  // rows whose places stay in the second-level cache anyway

// In half words where these hold 2n.
template <class Index>
struct ColumnState {
  Index block;  // the row with which the column was last stored in ju
  Index flag;   // row in work: 2k for an entry of A, 2k + 1 for a column of the tail or an extra
};

template <class Index>
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
        columns_(reinterpret_cast<ColumnState<Index>*>(m.work + m.work_capacity - 2 * n_)) {}

  // 0, 106, or 105 when the subscripts do not fit: shortfall() words are missing then.
  SmStatus run();
  i64 shortfall() const { return juptr_ + 1 - room_; }

 private:
  // The sorted tail and the sorted extras, read as one ascending list; n ends it.
  struct Joined {
    const i64 *tail, *tail_end, *extra, *extra_end;
    i64 n;

    i64 column() const {
      const i64 a = tail != tail_end ? *tail : n;
      const i64 b = extra != extra_end ? *extra : n;
      return std::min(a, b);
    }
    void next() { extra == extra_end || (tail != tail_end && *tail < *extra) ? ++tail : ++extra; }
  };

  [[gnu::always_inline]] void fetch_chains(i64 k) const;
  SmStatus row(i64 k);
  bool repeats_row_before(i64 k) const;
  SmStatus own_entries(i64 k, bool& is_tail);
  i64 longest_tail(i64 k);
  i64 block_of_tail() const;
  void collect_extras(i64 k, i64 others);
  template <class IsIn>
  void collect(i64 k, IsIn is_in);
  void sort_extras(i64 k);
  bool store_joined(i64 k);
  bool found_in_last_block(i64 k);
  Joined joined() const { return {tail_, tail_ + tail_length_, collected_, collected_ + count_, n_}; }
  i64 length(i64 i) const { return iu_[i + 1] - iu_[i]; }

  const SmMatrix& m_;
  i64 n_;
  i64 room_;  // slots of ju
  i64 *iju_, *iu_, *jl_, *ju_;
  ColumnState<Index>* columns_;
  i64 juptr_ = -1;             // last slot used
  i64 jumin_ = 0;              // first slot of the last block
  const i64* tail_ = nullptr;  // the longest tail that the row takes over
  i64 tail_length_ = 0;
  i64* collected_ = nullptr;  // the row's own entries, then its extras
  i64 count_ = 0;             // how many
};

// Whether the entries of row k are those of row k - 1 but for column k: rows of a dense block are, and where all of
// them have the same border. What was found of row k - 1 holds then.
template <class Index>
inline bool SymbolicRows<Index>::repeats_row_before(i64 k) const {
  const i64 row = m_.perm[k];
  const i64 before = m_.perm[k - 1];
  const i64 count = m_.row_start[row + 1] - m_.row_start[row] - 1;
  if (count < 0 || m_.row_start[before + 1] - m_.row_start[before] - 2 != count) return false;
  const i64* column = m_.col_index + m_.row_start[row];
  const i64* known = m_.col_index + m_.row_start[before] + 1;
  if (*column++ != row) return false;
  i64 same = 0;
  while (same < count && column[same] == known[same]) ++same;
  return known[same] == row && std::equal(column + same, column + count, known + same + 1);
}

// Entries of row k in the new order, unsorted. is_tail: every one of them is in the block that k was stored with.
template <class Index>
SmStatus SymbolicRows<Index>::own_entries(i64 k, bool& is_tail) {
  const i64 row = m_.perm[k];
  const Index block = columns_[k].block;
  const i64 flag = 2 * k;
  collected_ = iu_ + k + 2;
  count_ = 0;
  for (i64 p = m_.row_start[row]; p < m_.row_start[row + 1]; ++p) {
    const i64 c = m_.inv_perm[m_.col_index[p]];
    if (c <= k) continue;
    if (columns_[c].flag == flag) return SM_SYMBOLIC_FAILED;
    columns_[c].flag = static_cast<Index>(flag);
    collected_[count_++] = c;
    is_tail = is_tail && columns_[c].block == block;
  }
  return SM_OK;
}

// The chain of a row to come: its first tail, and where that of a later row begins. What is chained until then comes
// without.
template <class Index>
inline void SymbolicRows<Index>::fetch_chains(i64 k) const {
  if (n_ <= kNearRows || k + kChainAhead >= n_) return;
  if (const i64 i = jl_[k + kChainAhead]; i >= 0) {
    __builtin_prefetch(iju_ + i);
    __builtin_prefetch(iu_ + i);
    __builtin_prefetch(jl_ + i);
  }
  if (const i64 i = jl_[k + kChainAhead / 2]; i >= 0) __builtin_prefetch(ju_ + iju_[i] + 1);
}

// Of the tails that row k takes over, the longest; answers how many columns the others have together.
template <class Index>
i64 SymbolicRows<Index>::longest_tail(i64 k) {
  iju_[k] = juptr_;
  tail_length_ = 0;
  i64 all = 0;
  for (i64 i = jl_[k]; i >= 0; i = jl_[i]) {
    const i64* column = ju_ + iju_[i] + 1;
    __builtin_prefetch(column);  // all but the longest are read soon
    __builtin_prefetch(column + kLine);
    const i64 columns = length(i) - 1;
    all += columns;
    if (columns > tail_length_) {
      tail_length_ = columns;
      iju_[k] = iju_[i] + 1;
    }
  }
  tail_ = ju_ + iju_[k];
  return all - tail_length_;
}

// Leaves in collected_ what is not in the tail. Whether a column is new cannot be foretold, so it is put down in any
// case and then counted or not; there is always room, since the tail has a column at least.
template <class Index>
template <class IsIn>
void SymbolicRows<Index>::collect(i64 k, IsIn is_in) {
  const i64 own = count_;
  const i64 flag = 2 * k + 1;  // compared as a whole word: comparing half words takes longer
  count_ = 0;
  const auto take = [&](i64 c) {
    const bool known = columns_[c].flag == flag || is_in(c);
    columns_[c].flag = static_cast<Index>(flag);
    collected_[count_] = c;
    count_ += known ? 0 : 1;
  };
  for (i64 t = 0; t < own; ++t) take(collected_[t]);
  for (i64 i = jl_[k]; i >= 0; i = jl_[i]) {
    const i64* column = ju_ + iju_[i];
    if (column + 1 == tail_) continue;
    for (i64 t = 1; t < length(i); ++t) take(column[t]);
  }
}

// The row with which the subscripts were stored that the tail is part of, if its first column still tells; else -2. A
// column behind the first that tells the same row is in the tail or behind it.
template <class Index>
i64 SymbolicRows<Index>::block_of_tail() const {
  const i64 block = columns_[*tail_].block;
  const i64* first = ju_ + iju_[block];
  return first <= tail_ && tail_ + tail_length_ <= first + length(block) ? block : -2;
}

template <class Index>
void SymbolicRows<Index>::collect_extras(i64 k, i64 others) {
  if (tail_length_ == 0) return;  // the row has its own entries only, each once
  if ((count_ + others) * kSearchGain < tail_length_) {
    const i64 block = block_of_tail();
    const i64 last = tail_[tail_length_ - 1];
    collect(k, [&](i64 c) {
      return (columns_[c].block == block && c <= last) || find_column(tail_, tail_length_, c) < tail_length_;
    });
  } else {
    for (const i64* c = tail_; c != tail_ + tail_length_; ++c) columns_[*c].flag = static_cast<Index>(2 * k + 1);
    collect(k, [](i64) { return false; });
  }
}

// Leaves the extras ascending. Many of them are marked in a bitmap of the columns to come, together with the tail, and
// the whole row read from there; the tail is then empty. Where they are few among these columns, each goes where as
// many are smaller. The bitmap takes the last of the words that hold the columns collected: what is written stays
// behind what is read, even when no column is missing.
template <class Index>
void SymbolicRows<Index>::sort_extras(i64 k) {
  const i64 columns = n_ - k - 1;
  const i64 words = (columns + kBits - 1) / kBits;
  if (count_ < kFewExtras || words > kBitmapGain * count_ || count_ + words > columns) {
    if (count_ >= kFewExtras && count_ <= kRankSorted && columns < kRankReach) {
      sort_by_ranks(collected_, count_, k);
    } else {
      std::sort(collected_, collected_ + count_);
    }
    return;
  }
  auto* bitmap = reinterpret_cast<std::uint64_t*>(collected_ + columns - words);
  std::fill_n(bitmap, words, 0);
  const auto mark = [&](i64 c) { bitmap[(c - k - 1) / kBits] |= std::uint64_t{1} << (c - k - 1) % kBits; };
  std::for_each(collected_, collected_ + count_, mark);
  std::for_each(tail_, tail_ + tail_length_, mark);
  i64* next = collected_;
  for (i64 w = 0; w < words; ++w) {
    const i64 first = k + 1 + w * kBits;
    for (std::uint64_t left = bitmap[w]; left != 0; left &= left - 1) *next++ = first + std::countr_zero(left);
  }
  count_ = next - collected_;
  tail_length_ = 0;
}

// Looks for the row in the last block of subscripts. True when all of it is there; when the block ends first, the new
// block may start inside it.
template <class Index>
bool SymbolicRows<Index>::found_in_last_block(i64 k) {
  const i64* first = ju_ + jumin_;
  const i64* last = ju_ + juptr_ + 1;
  Joined list = joined();
  const i64* hit = std::lower_bound(first, last, list.column());
  if (hit == last || *hit != list.column()) return false;
  const i64* slot = hit;
  for (; slot != last && list.column() == *slot; ++slot) list.next();
  if (list.column() >= n_) {
    iju_[k] = hit - ju_;
    return true;
  }
  if (slot == last) juptr_ = hit - ju_ - 1;
  return false;
}

// Puts the row into ju. False when there is no room. A new block that starts inside the last one repeats what stands
// there, so the tail, which may stand there too, is not disturbed.
template <class Index>
bool SymbolicRows<Index>::store_joined(i64 k) {
  if (found_in_last_block(k)) return true;
  jumin_ = juptr_ + 1;
  juptr_ += tail_length_ + count_;
  if (juptr_ >= room_) return false;
  i64* slot = ju_ + jumin_;
  for (Joined list = joined(); list.column() < n_; list.next()) {
    const i64 c = list.column();
    *slot++ = c;
    columns_[c].block = static_cast<Index>(k);
  }
  iju_[k] = jumin_;
  return true;
}

template <class Index>
SmStatus SymbolicRows<Index>::row(i64 k) {
  const i64 updating = jl_[k];
  bool is_tail = updating >= 0 && jl_[updating] < 0;
  if (!is_tail || updating != k - 1 || !repeats_row_before(k)) SM_TRY(own_entries(k, is_tail));
  i64 count = 0;
  if (is_tail) {
    iju_[k] = iju_[updating] + 1;
    count = length(updating) - 1;
  } else {
    collect_extras(k, longest_tail(k));
    if (count_ > 0) {
      sort_extras(k);
      if (!store_joined(k)) return SM_TOO_LARGE;
    }
    count = tail_length_ + count_;
  }
  if (count > 1) {
    const i64 first = ju_[iju_[k]];
    jl_[k] = jl_[first];
    jl_[first] = k;
  }
  iu_[k + 1] = iu_[k] + count;
  return SM_OK;
}

template <class Index>
SmStatus SymbolicRows<Index>::run() {
  if (room_ < 0) return SM_TOO_LARGE;  // not even the columns' words fit
  std::fill_n(columns_, n_, ColumnState<Index>{-1, -1});
  std::fill_n(jl_, n_, -1);
  iu_[0] = 0;
  const LookAhead ahead(m_, false);
  for (i64 k = 0; k < n_; ++k) {
    ahead.past(k);
    fetch_chains(k);
    SM_TRY(row(k));
  }
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

template <class Index>
SmStatus find_structure(SmMatrix& m) {
  for (;;) {
    SymbolicRows<Index> rows(m);
    const SmStatus status = rows.run();
    if (status != SM_TOO_LARGE) return status;
    SM_TRY(extend_workspace(m, rows.shortfall(), 0));
  }
}

// Room for n positions, n reciprocal pivots and the values of U behind the integers, which alone are kept.
SmStatus make_room_for_values(SmMatrix& m) {
  const i64 n = m.rows;
  const i64 integers = 3 * n + 1 + m.work[n - 1];
  const i64 available = (m.work_capacity - 2 * n) - (integers + m.factor_block) / m.factor_block;
  const i64 values = m.work[2 * n];
  return values <= available ? SM_OK : extend_workspace(m, values - available, integers + 1);
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

SmStatus factor_symbolic(SmMatrix& m) { return factor_symbolic(m, width_for<std::int32_t>(2 * m.rows)); }

SmStatus factor_symbolic(SmMatrix& m, IndexWidth width) {
  SM_PASS(may_find_structure(m));
  SM_TRY(width == IndexWidth::half ? find_structure<std::int32_t>(m) : find_structure<i64>(m));
  SM_TRY(make_room_for_values(m));
  m.factor_iju = m.work;
  m.factor_iu = m.work + m.rows;
  m.factor_ju = m.work + 3 * m.rows + 1;
  m.state = SM_STATE_SYMBOLIC;
  return SM_OK;
}

}  // namespace sm
