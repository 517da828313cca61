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
// among the columns of its parent, whose square, the front, is kept until the last child has been served: a block uses
// it as it stands, or copies its part of it; where it was too large to keep, Z is collected from the rows.
//
//   block_tree.hpp      the tree, and the walk
//   inverse_fronts.hpp  the squares, and who shares them
//   inverse_gather.cpp  Z on a tail from its rows
//   inverse_square.cpp  the rows of a block from the square behind them
//   small_inverse_body.hpp  the rows of a small leaf
//   inverse_panels.cpp  the same for blocks that are too large for a square
#include "cholesky/selected_inverse.hpp"

#include <algorithm>
#include <cmath>
#include <numeric>

#include "cholesky/inverse_fronts.hpp"
#include "cholesky/search.hpp"

namespace sm {

namespace {

constexpr i64 kMostFrontValues = 3 << 19;  // 12 MB
constexpr i64 kLongLeaf = 100;             // above, a row without a front to read is better off with a square

// Whether a block with this tail is better off in the front of its parent than in a smaller one of its own: it would
// be copied once, where all strips of the block multiply by columns that the block has not.
bool is_worth_sharing(const Front& parent, const Block& u) {
  const i64 strips = (u.width + 7) / 8;
  const i64 tail = u.tail_length();
  return parent.room >= u.width && parent.order * parent.order * strips <= tail * tail * (strips + 2);
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
  void enter(const Block& u, const Front* parent, bool shared, const Front& front);
  void invert_row(const Block& u, const Front& front);
  void invert_leaf(const Block& u, const Front* parent);
  void invert_in_front(const Block& u, const Front* parent, bool shared, Front& front, bool rows);
  void store(const Block& u, const Front& front, bool rows);
  void fetch(i64 first) const;

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
  find_places(*parent, u.tail, tail, place);
  for (i64 i = 0; i < tail; ++i) {
    const double* from = parent->z.row(place[i]);
    double* to = behind.row(i);
    for (i64 j = 0; j < tail; ++j) to[j] = from[place[j]];
  }
}

// The only row of a block: the columns of its tail, as work_.place has them, among those behind it.
void Inversion::invert_row(const Block& u, const Front& front) {
  const i64 tail = u.length;
  const i64 behind = front.order - 1;
  const i64* place = work_.place;
  const Square& z = front.z;
  double* y = z.first + 1;
  tile_kernels().multiply_rows(tail, place, u.values, z.row(1) + 1, z.step, behind, y);
  double sum = 0.0;
  for (i64 i = 0; i < tail; ++i) sum += u.values[i] * y[place[i]];
  z.first[0] = z_.u.diag[u.first] + sum;
  for (i64 i = 0; i < behind; ++i) z.row(i + 1)[0] = y[i];
}

// A single row without children, straight from its parent's front, or else from the rows of its columns.
void Inversion::invert_leaf(const Block& u, const Front* parent) {
  const i64 tail = u.length;
  const double* v = u.values;
  double* y = leaves_ ? z_.values + z_.u.iu[u.first] : work_.panel;
  i64* place = work_.place;
  if (parent) find_places(*parent, u.tail, tail, place);
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

void Inversion::store(const Block& u, const Front& front, bool rows) {
  const Block out = z_.at(u.first);
  const i64 tail = u.tail_length();
  for (i64 r = 0; r < u.width; ++r) {
    const double* from = front.z.row(r);
    z_.diag[u.first + r] = from[r];
    if (!rows) continue;
    double* to = std::copy(from + r + 1, from + u.width, out.row(r) + r + 1);
    from += u.width;
    for (i64 j = 0; j < tail; ++j) to[j] = from[work_.place[j]];
  }
}

// Columns of a new front, and Z behind the block's own ones, unless they are the parent's; notes in work_.place where
// the columns of the tail are.
void Inversion::enter(const Block& u, const Front* parent, bool shared, const Front& front) {
  const i64 tail = u.tail_length();
  std::iota(front.column, front.column + u.width, u.first);
  if (shared) {
    find_places(*parent, u.tail, tail, work_.place);
    return;
  }
  std::copy_n(u.tail, tail, front.column + u.width);
  copy_tail(u, parent, {front.z.row(u.width) + u.width, front.z.step});
  std::iota(work_.place, work_.place + tail, 0);
}

void Inversion::invert_in_front(const Block& u, const Front* parent, bool shared, Front& front, bool rows) {
  enter(u, parent, shared, front);
  if (u.width == 1 && is_accepted(z_.u.diag[u.first])) {
    invert_row(u, front);
  } else {
    for (i64 r = 0; r < u.width; ++r) std::fill_n(front.z.row(r), front.order, 0.0);
    solve_square(u, z_.u.diag + u.first, front.z, front.order, shared ? work_.place : nullptr, work_);
  }
  store(u, front, rows);
  // No element is larger than the largest of the diagonal.
  bool finite = true;
  for (i64 r = 0; r < (shared ? u.width : front.order); ++r) finite = finite && std::isfinite(front.z.row(r)[r]);
  if (!finite) front.room = 0;
}

void Inversion::invert(i64 first) {
  const Block u = z_.tree.at(first);
  const i64 order = u.length + 1;
  const i64 above = z_.tree.parent(u);
  const Front* parent = fronts_.find(above);
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
  Front front;
  const bool shared = parent && fronts_.has_place() && is_worth_sharing(*parent, u);
  if (shared) {
    front = FrontStack::grown(*parent, u.width);
  } else if (order > kMostFrontOrder || !fronts_.open(order, front)) {
    invert_in_panels(z_, first, work_);
    return;
  }
  invert_in_front(u, parent, shared, front, keep || leaves_);
  if (keep) fronts_.keep(front, first, parent && z_.tree.is_last_child(first, above));
}

// What the block needs from memory, once its words are there.
void Inversion::fetch(i64 first) const {
  constexpr i64 kFetched = 16;
  const Block u = z_.tree.at(first);
  const double* out = z_.values + z_.u.iu[first];
  for (i64 j = 0; j < std::min(u.length, kFetched); j += 8) {
    __builtin_prefetch(u.tail + j);
    __builtin_prefetch(u.values + j);
    __builtin_prefetch(out + j, 1);
  }
}

// Blocks lie anywhere in the workspace: the words of one that comes kAhead later are asked for while a block is in
// work, and half of the way later what they lead to.
void Inversion::run() {
  constexpr i64 kAhead = 16;
  i64 queue[kAhead];
  i64 end = 0;
  i64 next = z_.tree.root();
  const auto read = [&] {
    if (end > 0) next = z_.tree.next(queue[(end - 1) % kAhead]);
    if (next < 0) return;
    z_.tree.fetch_words(next);
    __builtin_prefetch(z_.diag + next, 1);
    queue[end++ % kAhead] = next;
  };
  while (next >= 0 && end + 1 < kAhead) read();
  for (i64 at = 0; at < end; ++at) {
    if (next >= 0) read();
    if (at + kAhead / 2 < end) fetch(queue[(at + kAhead / 2) % kAhead]);
    invert(queue[at % kAhead]);
  }
}

// Words that all fronts would take together, as far as they may be kept.
i64 front_values(const BlockTree& tree) {
  i64 sum = 0;
  for (i64 first = tree.root(); first >= 0 && sum < kMostFrontValues; first = tree.next(first)) {
    const i64 order = tree.at(first).length + 1;
    if (order <= kMostFrontOrder) sum += FrontStack::size(order);
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
  FrontStack fronts(room.data(), capacity, work.data()->front_column);
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
