// Selected inversion: the generalized inverse Z = U^-1 D^- U^-T on the pattern of U, from U Z = D^- U^-T, rows from the
// last to the first (Takahashi, Fagan, Chin, Formation of a sparse bus impedance matrix and its application to short
// circuit study, Proc. 8th PICA Conf. 1973; Erisman, Tinney, Commun. ACM 18 (1975) 177-179):
//
//   z_ij = -sum over k > i of u_ik z_kj,   z_ii = 1/d_i - sum over k > i of u_ik z_ki
//
// Row i needs Z where the columns of its own row meet, all of which is on the pattern. A row whose pivot was dropped is
// zero, and so is its column.
//
// As in the factorization the unit is a block of rows with one tail (blocks.hpp): Z on the tail, as a full square,
// times -U of the block, by the tile kernels. Blocks are walked down their tree. The columns of a block's tail are
// among the columns of its parent, so that the square is copied from the parent's one, the front, which is kept until
// the last child has been served; where it was too large to keep, it is collected from the rows.
//
//   block_tree.hpp      the tree, and the walk
//   inverse_gather.cpp  Z on a tail from its rows
//   inverse_square.cpp  the rows of a block from the square behind them
//   small_inverse_body.hpp  the rows of a small leaf
//   inverse_panels.cpp  the same for blocks that are too large for a square
#include "cholesky/selected_inverse.hpp"

#include <algorithm>

#include "cholesky/inverse_work.hpp"
#include "cholesky/search.hpp"

namespace sm {

namespace {

constexpr i64 kMostFronts = 512;
constexpr i64 kMostFrontValues = 3 << 19;  // 12 MB
constexpr i64 kShortTail = 12;             // below, a kernel's overhead is larger than its gain
constexpr i64 kLongLeaf = 100;             // above, a row without a front to read is better off with a square

// Z on the columns of a block, its own ones first.
struct Front {
  i64 block;
  Square z;
  i64 order;
};

// Fronts of the blocks above the one in work, with room behind them for that one's.
class FrontStack {
 public:
  FrontStack(double* values, i64 capacity) : values_(values), capacity_(capacity) {}

  // The front of block `parent`, or null; those of finished blocks are dropped.
  const Front* find(i64 parent);
  // Null when there is no room.
  double* room(i64 order) {
    return count_ < kMostFronts && capacity_ - used_ >= order * order ? values_ + used_ : nullptr;
  }
  void push(i64 block, i64 order) {
    fronts_[count_++] = {block, {values_ + used_, order}, order};
    used_ += order * order;
  }
  // In place of the last one.
  void replace(i64 block, i64 order);

 private:
  double* values_;
  i64 capacity_;
  i64 used_ = 0;
  i64 count_ = 0;
  Front fronts_[kMostFronts];
};

const Front* FrontStack::find(i64 parent) {
  while (count_ > 0 && (parent < 0 || fronts_[count_ - 1].block < parent)) {
    --count_;
    used_ -= fronts_[count_].order * fronts_[count_].order;
  }
  return count_ > 0 && fronts_[count_ - 1].block == parent ? fronts_ + count_ - 1 : nullptr;
}

void FrontStack::replace(i64 block, i64 order) {
  const double* from = values_ + used_;
  Front& last = fronts_[--count_];
  used_ -= last.order * last.order;
  std::copy_n(from, order * order, values_ + used_);
  push(block, order);
}

class Inversion {
 public:
  // Without leaves only the diagonal is kept of blocks that no other one needs.
  Inversion(const InverseRows& z, bool leaves, FrontStack& fronts, InverseWork& work)
      : z_(z), leaves_(leaves), fronts_(fronts), work_(work) {
    work_.tail_length = -1;
  }
  void run();

 private:
  void invert(i64 first);
  void copy_tail(const Block& u, const Front* parent, const Square& behind);
  void invert_small_leaf(const Block& u, const Front* parent);
  void invert_row(const Block& u, const Square& z);
  void invert_leaf(const Block& u, const Front* parent);
  void store(const Block& u, const Square& z, bool rows);

  const InverseRows& z_;
  bool leaves_;
  FrontStack& fronts_;
  InverseWork& work_;
};

// The square behind the block's own columns.
void Inversion::copy_tail(const Block& u, const Front* parent, const Square& behind) {
  const i64 tail = u.tail_length();
  if (!parent) {
    gather(z_, {u.tail, 0, tail, 0, tail}, behind, work_.place);
    return;
  }
  i64* place = work_.place;
  find_places(z_.tree.at(parent->block), u.tail, 0, tail, place);
  for (i64 i = 0; i < tail; ++i) {
    const double* from = parent->z.row(place[i]);
    double* to = behind.row(i);
    for (i64 j = 0; j < tail; ++j) to[j] = from[place[j]];
  }
}

// The only row of a block.
void Inversion::invert_row(const Block& u, const Square& z) {
  const i64 tail = u.length;
  const double d = z_.u.diag[u.first];
  double* y = z.first + 1;
  double sum = 0.0;
  if (tail < kShortTail) {
    for (i64 i = 0; i < tail; ++i) {
      const double v = u.values[i];
      const double* from = z.row(i + 1) + 1;
      for (i64 j = 0; j < tail; ++j) y[j] += v * from[j];
    }
  } else {
    const TileKernels& tiles = tile_kernels();
    strip_coefficients(u, z_.u.diag + u.first, 0, 1, 1, tail + 1, work_.coefficient);
    tiles.strip(1, tail, work_.coefficient, {z.row(1) + 1, z.step, 0, tiles.tile_columns}, tail, &y, Finish::store);
  }
  for (i64 i = 0; i < tail; ++i) sum += u.values[i] * y[i];
  z.first[0] = d + sum;
  for (i64 i = 0; i < tail; ++i) z.row(i + 1)[0] = y[i];
}

// A single row without children, straight from its parent's front, or else from the rows of its columns.
void Inversion::invert_leaf(const Block& u, const Front* parent) {
  const i64 tail = u.length;
  const double* v = u.values;
  double* y = leaves_ ? z_.values + z_.u.iu[u.first] : work_.panel;
  i64* place = work_.place;
  if (parent) find_places(z_.tree.at(parent->block), u.tail, 0, tail, place);
  Block b = {-1, 0, 0, nullptr, nullptr};
  std::fill_n(y, tail, 0.0);
  double diagonal = 0.0;
  for (i64 i = 0; i < tail; ++i) {
    if (!parent && u.tail[i] >= b.first + b.width) {
      b = z_.at(z_.tree.block_of(u.tail[i]));
      find_places(b, u.tail, i + 1, tail, place + i + 1);
    }
    const double* from = parent ? parent->z.row(place[i]) : b.row(u.tail[i] - b.first);
    const double vi = v[i];
    double sum = y[i] + vi * (parent ? from[place[i]] : z_.diag[u.tail[i]]);
    for (i64 j = i + 1; j < tail; ++j) {
      const double element = from[place[j]];
      sum += v[j] * element;
      y[j] += vi * element;
    }
    y[i] = sum;
    diagonal += vi * sum;
  }
  z_.diag[u.first] = z_.u.diag[u.first] + diagonal;
}

// A few rows without children.
void Inversion::invert_small_leaf(const Block& u, const Front* parent) {
  const i64 tail = u.tail_length();
  if (tail != work_.tail_length || !std::equal(u.tail, u.tail + tail, work_.tail)) {
    std::fill_n(work_.behind, tail * kMostSmallTail, 0.0);
    copy_tail(u, parent, {work_.behind, kMostSmallTail});
    work_.tail = u.tail;
    work_.tail_length = tail;
  }
  const Block out = z_.at(u.first);
  tile_kernels().invert_small(u, z_.u.diag + u.first, work_.behind, leaves_ ? &out : nullptr, z_.diag + u.first);
}

void Inversion::store(const Block& u, const Square& z, bool rows) {
  const Block out = z_.at(u.first);
  for (i64 r = 0; r < u.width; ++r) {
    const double* from = z.row(r);
    if (rows) std::copy(from + r + 1, from + u.length + 1, out.row(r) + r + 1);
    z_.diag[u.first + r] = from[r];
  }
}

void Inversion::invert(i64 first) {
  const Block u = z_.tree.at(first);
  const i64 order = u.length + 1;
  const Front* parent = fronts_.find(z_.tree.parent(u));
  const bool keep = z_.tree.child(first) >= 0;
  const bool single = u.width == 1 && is_accepted(z_.u.diag[first]);
  if (single && !keep && order <= kMostFrontOrder && (parent || u.length <= kLongLeaf)) {
    invert_leaf(u, parent);
    return;
  }
  if (!single && !keep && u.width <= kMostSmallRows && u.tail_length() <= kMostSmallTail) {
    invert_small_leaf(u, parent);
    return;
  }
  double* room = order <= kMostFrontOrder ? fronts_.room(order) : nullptr;
  if (!room) {
    invert_in_panels(z_, first, work_);
    return;
  }
  const Square z = {room, order};
  std::fill_n(room, u.width * order, 0.0);
  copy_tail(u, parent, {z.row(u.width) + u.width, z.step});
  if (single) {
    invert_row(u, z);
  } else {
    solve_square(u, z_.u.diag + first, z, order, work_);
  }
  store(u, z, keep || leaves_);
  if (!keep) return;
  if (parent && z_.tree.sibling(first) < 0) {
    fronts_.replace(first, order);
  } else {
    fronts_.push(first, order);
  }
}

void Inversion::run() {
  for (i64 first = z_.tree.root(); first >= 0; first = z_.tree.next(first)) invert(first);
}

// Words that all fronts would take together, as far as they may be kept.
i64 front_values(const BlockTree& tree) {
  i64 sum = 0;
  for (i64 first = tree.root(); first >= 0 && sum < kMostFrontValues; first = tree.next(first)) {
    const i64 order = tree.at(first).length + 1;
    if (order <= kMostFrontOrder) sum += order * order;
  }
  return std::min(sum, kMostFrontValues);
}

}  // namespace

SmStatus SelectedInverse::compute(Wanted wanted) {
  const NumericArrays u(m_, m_.factor_scratch - m_.work);
  SM_TRY(need_pool(m_));
  SM_TRY(diag_.take(m_.pool, u.n));
  SM_TRY(values_.take(m_.pool, std::max<i64>(u.iu[u.n], 1)));  // rows are addressed even where none has entries
  BlockTree tree(u);
  tree.build();
  const i64 capacity = front_values(tree);
  Scratch<double> room;
  Scratch<InverseWork> work;
  SM_TRY(room.take(m_.pool, capacity));
  SM_TRY(work.take(m_.pool, 1));
  FrontStack fronts(room.data(), capacity);
  Inversion({u, tree, values_.data(), diag_.data()}, wanted == Wanted::pattern, fronts, *work.data()).run();
  return SM_OK;
}

i64 SelectedInverse::place(const SmMatrix& m, i64 i, i64 j) {
  const i64 row = std::min(m.inv_perm[i], m.inv_perm[j]);
  if (i == j) return -1 - row;
  const i64 column = std::max(m.inv_perm[i], m.inv_perm[j]);
  const i64 length = m.factor_iu[row + 1] - m.factor_iu[row];
  const i64 at = find_column_at_ends(m.factor_ju + m.factor_iju[row], length, column);
  return at < length ? m.factor_iu[row] + at : kNowhere;
}

}  // namespace sm
