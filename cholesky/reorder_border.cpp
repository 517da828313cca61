// Moving rows as closing left them into the factor's order, each entry that changes rows by way of one copy.
//
// An entry of row i only ever moves to a later row j > i. Row j of the new order is its diagonal, what came from
// earlier rows, and what stays; it ends no later than the old row j did, so the rows can be written one behind the
// other where they are, as soon as what moves has been taken out. What moves is sorted by counting how many each row
// receives.
//
// Long rows that stand together, the border of a matrix of many small blocks, each reach a large part of all rows. They
// are walked side by side, some columns at a time: what a row receives is then put down while its memory is at hand.
// Where the first of these have every one of those columns, only their values are taken out, as they stand.
#include <algorithm>
#include <array>
#include <utility>

#include "cholesky/reorder.hpp"

namespace sm {

namespace {

constexpr i64 kColumns = 256;  // of the rows walked side by side, at a time
constexpr i64 kSideBySide = 16;
constexpr i64 kLine = 8;         // words of a line of the cache
constexpr i64 kPanelAhead = 24;  // columns of a panel that are fetched early
constexpr i64 kShare = 8;        // a long row has an eighth of all columns, or more
constexpr i64 kFew = 16;         // of that many rows, one is long: with more of them most entries go where long rows go
// A block holds all columns of the rows side by side, so that one that is moved whole is none of theirs.
static_assert(kColumns >= kSideBySide);

struct Moved {
  i64 column;
  double value;
};

// Rows [first, last) at the columns [column, column + length), all of which every one of them has; row i has the first
// of them at at[i - first].
struct Block {
  i64 first, last;
  i64 column, length;
  const i64* at;
};

class MovedEntries {
 public:
  explicit MovedEntries(SmMatrix& m)
      : m_(m),
        n_(m.rows),
        next_(m.work),
        kept_end_(m.work + n_),
        moved_(reinterpret_cast<Moved*>(m.work + 2 * n_)),
        first_(n_) {}

  // Whether a good part of all entries is in a few long rows that stand together.
  bool has_border() const;
  // False when the rows are not as closing leaves them, or what moves has no room.
  bool count();
  void take_out();
  void join();

 private:
  bool is_long(i64 i) const {
    const i64 length = m_.row_start[i + 1] - m_.row_start[i];
    return length > 2 * kColumns && length * kShare > n_;
  }
  void for_each_part(auto&& visit, auto&& visit_block) const;
  void side_by_side(i64 first, i64 last, auto&& visit, auto&& visit_block) const;
  bool ends_agree(const Block& block) const;
  bool all_move(const Block& block) const;
  bool is_full(const Block& block) const;
  i64 panels() const { return (n_ - first_ + kColumns - 1) / kColumns; }
  const double* panel_at(i64 j) const;
  void fetch_panel(const double* panel, i64 column, i64 apart) const;
  void receive(i64 j, const double* panel, i64& from, i64 to);

  SmMatrix& m_;
  i64 n_;
  i64* next_;      // how many entries row j receives; then where the next of them goes, in the end the end of them
  i64* kept_end_;  // behind the entries that row i keeps, which stand at its start
  Moved* moved_;
  // The first rows side by side that have a block: the values of each of their blocks, row after row.
  i64 first_;             // or n
  i64 beside_ = 0;        // how many rows
  i64* panel_ = nullptr;  // where those of a block begin, or -1
  double* panel_values_ = nullptr;
};

// visit(i, begin, end) of parts of row i, from the left to the right; a column meets the rows in ascending order.
// visit_block(block) of rows side by side comes first, and does them all or says no.
void MovedEntries::for_each_part(auto&& visit, auto&& visit_block) const {
  for (i64 i = 0; i < n_;) {
    i64 last = i;
    while (last < n_ && last - i < kSideBySide && is_long(last)) ++last;
    if (last - i > 1) {
      side_by_side(i, last, visit, visit_block);
      i = last;
    } else {
      visit(i, m_.row_start[i], m_.row_start[i + 1]);
      ++i;
    }
  }
}

void MovedEntries::side_by_side(i64 first, i64 last, auto&& visit, auto&& visit_block) const {
  std::array<i64, kSideBySide> at{};
  std::copy(m_.row_start + first, m_.row_start + last, at.begin());
  for (i64 column = first; column < n_; column += kColumns) {
    const Block block{first, last, column, std::min(kColumns, n_ - column), at.data()};
    const bool done = ends_agree(block) && all_move(block) && visit_block(block);
    for (i64 i = first; i < last; ++i) {
      i64& begin = at[static_cast<std::size_t>(i - first)];
      const i64 most = std::min(m_.row_start[i + 1], begin + block.length);
      const i64 end =
          done ? most : std::lower_bound(m_.col_index + begin, m_.col_index + most, column + kColumns) - m_.col_index;
      if (!done) visit(i, begin, end);
      begin = end;
    }
  }
  for (i64 i = first; i < last; ++i) visit(i, at[static_cast<std::size_t>(i - first)], m_.row_start[i + 1]);
}

// In ascending rows, that is all it takes for every column of the block to be there.
bool MovedEntries::ends_agree(const Block& block) const {
  const i64 behind = block.length - 1;
  for (i64 i = block.first; i < block.last; ++i) {
    const i64 begin = block.at[i - block.first];
    if (begin + behind >= m_.row_start[i + 1]) return false;
    if (m_.col_index[begin] != block.column || m_.col_index[begin + behind] != block.column + behind) return false;
  }
  return true;
}

bool MovedEntries::all_move(const Block& block) const {
  const i64* place = m_.inv_perm + block.column;
  const i64 first = *std::min_element(m_.inv_perm + block.first, m_.inv_perm + block.last);
  return std::all_of(place, place + block.length, [&](i64 k) { return k < first; });
}

bool MovedEntries::is_full(const Block& block) const {
  i64 differs = 0;
  for (i64 i = block.first; i < block.last; ++i) {
    const i64* column = m_.col_index + block.at[i - block.first];
    i64 t = 0;
    for (; t + kLine <= block.length; t += kLine) {
      __builtin_prefetch(column + t + kColumns);  // of the next block
      for (i64 q = t; q < t + kLine; ++q) differs |= column[q] ^ (block.column + q);
    }
    for (; t < block.length; ++t) differs |= column[t] ^ (block.column + t);
  }
  return differs == 0;
}

bool MovedEntries::has_border() const {
  i64 rows = 0;
  i64 entries = 0;
  for (i64 i = 0; i + 1 < n_; ++i) {
    if (!is_long(i) || !is_long(i + 1)) continue;
    ++rows;
    entries += m_.row_start[i + 1] - m_.row_start[i];
  }
  return rows <= n_ / kFew && entries > m_.nnz / 3;
}

// Leaves kept_end_ at the end of rows that are kept whole, and at the start of others.
bool MovedEntries::count() {
  std::fill_n(next_, n_, 0);
  std::copy_n(m_.row_start, n_, kept_end_);
  bool as_closed = true;
  i64 all = 0;
  i64 in_panels = 0;
  const auto count_part = [&](i64 i, i64 begin, i64 end) {
    const i64 place = m_.inv_perm[i];
    i64 before = i - 1;
    if (begin > m_.row_start[i]) {
      before = m_.col_index[begin - 1];
    } else {
      as_closed &= begin < m_.row_start[i + 1] && m_.col_index[begin] == i;
    }
    const i64* column = m_.col_index;
    const i64* inv_perm = m_.inv_perm;
    i64* next = next_;
    i64 moving = 0;
    bool ascends = true;
    for (i64 p = begin; p < end; ++p) {
      const i64 j = column[p];
      const i64 moves = inv_perm[j] < place ? 1 : 0;
      ascends &= before < j;
      before = j;
      next[j] += moves;
      moving += moves;
    }
    as_closed &= ascends;
    all += moving;
    if (moving == 0 && begin == m_.row_start[i] && end == m_.row_start[i + 1]) kept_end_[i] = end;
  };
  const auto count_block = [&](const Block& block) {
    if (!is_full(block)) return false;
    const i64 rows = block.last - block.first;
    if (first_ == n_) {
      first_ = block.first;
      beside_ = rows;
    }
    if (block.first == first_) {
      in_panels += rows * block.length;
      return true;
    }
    for (i64 t = 0; t < block.length; ++t) next_[block.column + t] += rows;
    all += rows * block.length;
    return true;
  };
  for_each_part(count_part, count_block);
  panel_ = reinterpret_cast<i64*>(moved_ + all);
  panel_values_ = reinterpret_cast<double*>(panel_ + panels());
  return as_closed && m_.work_capacity - 2 * n_ >= 2 * all + panels() + in_panels;
}

void MovedEntries::take_out() {
  i64 before = 0;
  for (i64 j = 0; j < n_; ++j) before += std::exchange(next_[j], before);
  std::fill_n(panel_, panels(), -1);
  i64 in_panels = 0;
  const auto take_part = [&](i64 i, i64 begin, i64 end) {
    i64 kept = kept_end_[i];
    if (kept == end) return;
    const i64 place = m_.inv_perm[i];
    const i64* inv_perm = m_.inv_perm;
    i64* column = m_.col_index;
    double* value = m_.nz_values;
    i64* next = next_;
    Moved* moved = moved_;
    for (i64 p = begin; p < end; ++p) {
      const i64 j = column[p];
      const double v = value[p];
      if (inv_perm[j] < place) {
        moved[next[j]++] = {i, v};
      } else {
        column[kept] = j;
        value[kept] = v;
        ++kept;
      }
    }
    kept_end_[i] = kept;
  };
  const auto take_block = [&](const Block& block) {
    const i64 rows = block.last - block.first;
    if (block.first == first_) {
      panel_[(block.column - first_) / kColumns] = in_panels;
      for (i64 r = 0; r < rows; ++r, in_panels += block.length) {
        const double* value = m_.nz_values + block.at[r];
        for (i64 t = kColumns; t < 2 * kColumns; t += kLine) __builtin_prefetch(value + t);  // of the next block
        std::copy_n(value, block.length, panel_values_ + in_panels);
      }
      return true;
    }
    for (i64 t = 0; t < block.length; ++t) {
      Moved* to = moved_ + next_[block.column + t];
      for (i64 r = 0; r < rows; ++r) to[r] = {block.first + r, m_.nz_values[block.at[r] + t]};
      next_[block.column + t] += rows;
    }
    return true;
  };
  for_each_part(take_part, take_block);
}

// The values that row j receives from the rows of the panels, as far apart as these have columns, or null.
const double* MovedEntries::panel_at(i64 j) const {
  if (j < first_) return nullptr;
  const i64 column = (j - first_) % kColumns;
  const i64 panel = panel_[(j - first_) / kColumns];
  return panel < 0 ? nullptr : panel_values_ + panel + column;
}

// What a later column has in the panel, or in the next one, where that is as long. `panel` is at the column at hand.
void MovedEntries::fetch_panel(const double* panel, i64 column, i64 apart) const {
  const double* ahead = panel + kPanelAhead + (column + kPanelAhead < apart ? 0 : (beside_ - 1) * apart);
  for (i64 r = 0; r < beside_; ++r) __builtin_prefetch(ahead + r * apart);
}

// What row j receives, from slot `to` on: from rows before those of the panels, from these, and from later ones.
void MovedEntries::receive(i64 j, const double* panel, i64& from, i64 to) {
  i64* column = m_.col_index + to;
  double* value = m_.nz_values + to;
  const Moved* entry = moved_ + from;
  const Moved* end = moved_ + next_[j];
  from = next_[j];
  const auto put = [&] {
    *column++ = entry->column;
    *value++ = entry->value;
    ++entry;
  };
  if (panel) {
    while (entry != end && entry->column < first_) put();
    const i64 apart = std::min(kColumns, n_ - j + (j - first_) % kColumns);
    if ((j - first_) % kLine == 0) fetch_panel(panel, (j - first_) % kColumns, apart);
    for (i64 r = 0; r < beside_; ++r) {
      column[r] = first_ + r;
      value[r] = panel[r * apart];
    }
    column += beside_;
    value += beside_;
  }
  while (entry != end) put();
}

// Where a row keeps its entries, what it receives may come to stand: they leave first, the last of them first when they
// go to the right.
void MovedEntries::join() {
  i64* column = m_.col_index;
  double* value = m_.nz_values;
  i64 start = 0;
  i64 from = 0;
  for (i64 j = 0; j < n_; ++j) {
    const i64 old = std::exchange(m_.row_start[j], start);
    const i64 kept = kept_end_[j] - old - 1;  // behind the diagonal
    const double* panel = panel_at(j);
    const i64 end = start + 1 + (next_[j] - from) + (panel ? beside_ : 0) + kept;
    const i64 shift = end - kept_end_[j];
    const double diagonal = value[old];
    const auto shift_entry = [&](i64 p) {
      column[p + shift] = column[p];
      value[p + shift] = value[p];
    };
    if (shift < 0) {
      for (i64 p = old + 1; p < kept_end_[j]; ++p) shift_entry(p);
    } else if (shift > 0) {
      for (i64 p = kept_end_[j] - 1; p > old; --p) shift_entry(p);
    }
    column[start] = j;
    value[start] = diagonal;
    receive(j, panel, from, start + 1);
    start = end;
  }
}

}  // namespace

bool reorder_border(SmMatrix& m) {
  if (m.work_capacity < 2 * m.rows) return false;
  MovedEntries entries(m);
  if (!entries.has_border() || !entries.count()) return false;
  entries.take_out();
  entries.join();
  return true;
}

}  // namespace sm
