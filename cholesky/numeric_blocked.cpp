// Numeric factorization in blocks of rows of U that share their structure.
//
// Left-looking: block by block, everything that finished blocks have for its rows is subtracted, then the block is
// factored. A finished block waits in the list of the block that holds the next column of its tail, as the rows of the
// plain road do (numeric_rows.cpp; Eisenstat, Gursky, Schultz, Sherman 1982); rows with equal structure as blocks for
// dense kernels: Ng, Peyton, "Block sparse Cholesky algorithms on advanced uniprocessor computers", SIAM J. Sci.
// Comput. 14 (1993) 1034-1056. The storage is that of the plain road, with its fill: blocks are what is found in it,
// and no zero is ever stored to make one.
//
//   blocks.hpp        what a block is, and the lists
//   block_update.cpp  a block updates a later one: strips of coefficients -V D times the rows of the source
//   group_panel.hpp   blocks that have most of their columns in common do so together
//   block_factor.cpp  a block is factored
//   shared_tails.hpp  what blocks with one tail have for it, summed beforehand
//   tiles.hpp         the kernels under all of them
//
// Most blocks of two-dimensional and of pedigree matrices are single rows, and so are most updates. A single row
// gathers its updates in the dense row, by column; a wider block in its stored rows, at places that the words of the
// dense row behind it hold for the columns of its tail. Small products are added one by one, without a kernel.
#include <algorithm>
#include <bit>

#include "cholesky/block_work.hpp"
#include "cholesky/lookahead.hpp"
#include "cholesky/shared_tails.hpp"

namespace sm {

namespace {

constexpr i64 kFewProducts = 400;  // below, a kernel's overhead is larger than its gain

// target[to[j]] += sum over the rows of factor[s] * row s of the source, for j < count.
template <class Place>
void add_rows(double* target, const Place* to, i64 count, const double* source, i64 step, const double* factor,
              i64 rows) {
  for (; rows >= 4; rows -= 4, factor += 4) {
    const double *a = source, *b = a + step, *c = b + step - 1, *d = c + step - 2;
    const double fa = factor[0], fb = factor[1], fc = factor[2], fd = factor[3];
    for (i64 j = 0; j < count; ++j) target[to[j]] += (fa * a[j] + fb * b[j]) + (fc * c[j] + fd * d[j]);
    source = d + step - 3;
    step -= 4;
  }
  if (rows >= 2) {
    const double *a = source, *b = a + step;
    const double fa = factor[0], fb = factor[1];
    for (i64 j = 0; j < count; ++j) target[to[j]] += fa * a[j] + fb * b[j];
    source = b + step - 1;
    factor += 2;
    rows -= 2;
  }
  if (rows > 0) {
    const double f = *factor;
    for (i64 j = 0; j < count; ++j) target[to[j]] += f * source[j];
  }
}

// Row k of A behind its diagonal, which is answered, into a row of U; place[j] is where column j is. Not inlined: the
// loop needs all registers.
[[gnu::noinline]] double enter_row(const SmMatrix& m, i64 k, const i64* place, double* row) {
  const i64 begin = m.row_start[m.perm[k]];
  const i64 end = m.row_start[m.perm[k] + 1];
  const i64* const column = m.col_index;
  const i64* const inv_perm = m.inv_perm;
  const double* const value = m.nz_values;
  double d = 0.0;
  for (i64 p = begin; p < end; ++p) {
    const i64 j = inv_perm[column[p]];
    if (j > k) {
      row[place[j]] = value[p];
    } else if (j == k) {
      d = value[p];
    }
  }
  return d;
}

class BlockedRows {
 public:
  BlockedRows(const NumericArrays& a, Pivots& pivots, Panels& panels, SharedTails& shared)
      : a_(a),
        blocks_(a),
        pivots_(pivots),
        panels_(panels),
        shared_(shared),
        ahead_(a.m, true),
        place_(reinterpret_cast<i64*>(a.diag)) {}
  SmStatus run();

 private:
  SmStatus single_row(i64 k);
  double load_row(i64 k);
  double update_row(const Block& row, Followers& followers, double d);
  double add_shared_row(i64 k, double d);
  double subtract_block(const Source& s, double d);
  SmStatus block(i64 first);
  void add_shared_rows(const Target& target);
  void load_block(const Target& target);
  [[gnu::always_inline]] void leave(const SourceGroup& group, const Block& block, Followers& followers) const;
  void update_target(const Target& target, const SourceGroup& group);
  void update_target(const Target& target, Source& s);
  void subtract_products(const Target& target, const Source& s, i64 rows);

  const NumericArrays& a_;
  const Blocks blocks_;
  Pivots& pivots_;
  Panels& panels_;
  SharedTails& shared_;
  const LookAhead ahead_;
  i64* place_;  // the words of the dense row, as places
};

// Row k of A into the dense row, which is 0 elsewhere in the row's structure. Answers the diagonal.
double BlockedRows::load_row(i64 k) {
  const SmMatrix& m = a_.m;
  const i64 row = m.perm[k];
  double d = 0.0;
  ahead_.past(k);
  for (i64 p = m.row_start[row]; p < m.row_start[row + 1]; ++p) {
    const i64 j = m.inv_perm[m.col_index[p]];
    if (j > k) {
      a_.diag[j] = m.nz_values[p];
    } else if (j == k) {
      d = m.nz_values[p];
    }
  }
  return d;
}

// What a wider block has for the dense row.
double BlockedRows::subtract_block(const Source& s, double d) {
  double factor[kMostBlockRows];
  double* v = s.value;
  for (i64 r = 0; r < s.width; ++r) {
    const double u = *v;
    factor[r] = *v = -u * s.pivot[r];
    d += u * factor[r];
    v += s.step - r;
  }
  add_rows(a_.diag, s.column + 1, s.count - 1, s.value + 1, s.step, factor, s.width);
  return d;
}

// What becomes of a group that has updated the block.
inline void BlockedRows::leave(const SourceGroup& group, const Block& block, Followers& followers) const {
  if (blocks_.can_follow(group, block, followers)) {
    blocks_.follow(group, followers);
  } else {
    blocks_.await(group);
  }
}

// Everything that waits for the row. Answers the pivot.
double BlockedRows::update_row(const Block& row, Followers& followers, double d) {
  double* const dense = a_.diag;
  const auto subtract = [&](Source& s) {
    if (s.width == 1) {
      const double u = *s.value;
      const double f = -u * *s.pivot;
      *s.value = f;
      d += u * f;
      for (i64 j = 1; j < s.count; ++j) dense[s.column[j]] += f * s.value[j];
    } else {
      d = subtract_block(s, d);
    }
    s.done = 1;
  };
  blocks_.for_each_waiting(row.first, [&](const SourceGroup& group) {
    subtract(group.leader());
    for (Source* s = group.begin() + 1; s != group.end(); ++s) {
      if (*s->column == row.first) subtract(*s);
    }
    leave(group, row, followers);
  });
  return d;
}

double BlockedRows::add_shared_row(i64 k, double d) {
  shared_.for_each_row_before(k + 1, [&](i64 i, const SharedTails::SharedTail& tail) {
    d += tail.at(i, i);
    for (i64 j = i + 1; j < tail.count; ++j) a_.diag[tail.column[j]] += tail.at(i, j);
  });
  return d;
}

SmStatus BlockedRows::single_row(i64 k) {
  const Block b = blocks_.at(k, 1);
  for (i64 j = 0; j < b.length; ++j) a_.diag[b.tail[j]] = 0.0;
  Followers followers;
  double d = update_row(b, followers, load_row(k));
  if (shared_.has_rows_before(k + 1)) d = add_shared_row(k, d);
  SM_TRY(pivots_.judge(k, d, a_.diag[k]));
  for (i64 j = 0; j < b.length; ++j) b.values[j] = a_.diag[b.tail[j]];
  blocks_.await(b, followers);
  return SM_OK;
}

void BlockedRows::load_block(const Target& target) {
  const SmMatrix& m = a_.m;
  const Block& b = target.block;
  std::fill_n(b.values, b.row(b.width) + b.width + 1 - b.values, 0.0);
  for (i64 r = 0; r < b.width; ++r) place_[b.first + r] = r;
  for (i64 j = 0; j < b.tail_length(); ++j) place_[b.tail[j]] = b.width + j;
  double diagonal[kMostBlockRows];
  for (i64 r = 0; r < b.width; ++r) {
    ahead_.past(b.first + r);
    diagonal[r] = enter_row(m, b.first + r, place_, b.row(r));
  }
  std::copy_n(diagonal, b.width, a_.diag + b.first);
}

// The update of a few products.
void BlockedRows::subtract_products(const Target& target, const Source& s, i64 rows) {
  target.find_places(s.column, rows, s.count, panels_.to);
  double factor[kMostBlockRows];
  for (i64 i = 0; i < rows; ++i) {
    double d = a_.diag[s.column[i]];
    double* v = s.value + i;
    for (i64 r = 0; r < s.width; ++r) {
      const double u = *v;
      factor[r] = *v = -u * s.pivot[r];
      d += u * factor[r];
      v += s.step - r;
    }
    a_.diag[s.column[i]] = d;
    add_rows(target.block.row(s.column[i] - target.block.first), panels_.to + i + 1, s.count - i - 1, s.value + i + 1,
             s.step, factor, s.width);
  }
}

void BlockedRows::update_target(const Target& target, Source& s) {
  const i64 rows = s.done = target.rows_of(s);
  if (rows == 0) return;
  if (s.count <= kPanelColumns && s.width * rows * s.count < kFewProducts) {
    subtract_products(target, s, rows);
  } else {
    update_block(target, {&s, 1, s.width}, panels_);
  }
}

void BlockedRows::update_target(const Target& target, const SourceGroup& group) {
  if (group.count > 1) {
    Source& leader = group.leader();
    leader.done = target.rows_of(leader);
    if (leader.done > 1 && group.rows * leader.done * leader.count >= kFewProducts) {
      update_block(target, group, panels_);
      return;
    }
  }
  for (Source& s : group) update_target(target, s);
}

void BlockedRows::add_shared_rows(const Target& target) {
  const Block& b = target.block;
  shared_.for_each_row_before(b.first + b.width, [&](i64 i, const SharedTails::SharedTail& tail) {
    a_.diag[tail.column[i]] += tail.at(i, i);
    double* row = b.row(tail.column[i] - b.first);
    for (i64 j = i + 1; j < tail.count; ++j) row[target.place_of(tail.column[j])] += tail.at(i, j);
  });
}

SmStatus BlockedRows::block(i64 first) {
  const Block b = blocks_.at(first, blocks_.width(first));
  const Target target = {b, place_, a_.diag};
  load_block(target);
  Followers followers;
  blocks_.for_each_waiting(first, [&](const SourceGroup& group) {
    update_target(target, group);
    leave(group, b, followers);
  });
  if (shared_.has_rows_before(first + b.width)) add_shared_rows(target);
  double* square = shared_.square_for(b);
  SM_TRY(factor_block(b, a_.diag, square, pivots_, panels_));
  if (!square) blocks_.await(b, followers);
  return SM_OK;
}

SmStatus BlockedRows::run() {
  Blocks(a_).find();
  for (i64 k = 0, width = 0; k < a_.n; k += width) {
    width = blocks_.width(k);
    blocks_.fetch_ahead(k);
    SM_TRY(width == 1 ? single_row(k) : block(k));
  }
  return SM_OK;
}

}  // namespace

SmStatus factor_in_blocks(const NumericArrays& a, Pivots& pivots) {
  Panels panels;
  SharedTails shared;
  return BlockedRows(a, pivots, panels, shared).run();
}

}  // namespace sm
