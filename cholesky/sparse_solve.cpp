// Solves with a sparse factor: vectors into the order of the factor, two passes, and back.
#include <algorithm>
#include <cstdint>
#include <cstdlib>

#include "cholesky/steps.hpp"
#include "cholesky/substitution.hpp"
#include "cholesky/tiles.hpp"

namespace sm {

const SubstitutionPasses& substitution_passes() {
  switch (chosen_tiles()) {
    case TileSet::avx512:
      return kAvx512Substitution;
    case TileSet::avx2:
      return kAvx2Substitution;
    default:
      return kPortableSubstitution;
  }
}

namespace {

// Rows at the front of the factor that are leaves: blocks to which no row before them adds anything, and behind all of
// which are their tails.
struct Leaves {
  i64 count = 0;
  bool in_runs = false;  // most of them are neighbours in the vectors, too
};

// Only whole blocks of at most kStripRows: every pass cuts rows into the same strips then.
Leaves leaves_of(const FactorRows& f, const i64* perm) {
  i64 count = 0;
  i64 tail = f.n;  // where the first of all begins
  while (count < f.n) {
    const i64 end = count + f.rows_from(count);
    if (f.length(end - 1) > 0) tail = std::min(tail, f.columns(end - 1)[0]);
    if (end > tail || f.continues(end - 1)) break;
    count = end;
  }
  i64 apart = 0;
  for (i64 k = 1; k < count; ++k) apart += std::abs(perm[k] - perm[k - 1]) == 1 ? 0 : 1;
  return {count, apart <= count / kLanes};
}

constexpr std::uintptr_t kLine = 64;  // bytes: that of eight lanes
static_assert(kLine == kLanes * sizeof(double));

class SparseSolve {
 public:
  SparseSolve(const SmMatrix& m, i64 count)
      : n_(m.rows),
        perm_(m.perm),
        order_{m.rows, m.perm, m.inv_perm},
        rows_(m),
        leaves_(count < kLanes ? Leaves{} : leaves_of(rows_, perm_)),
        w_(reinterpret_cast<double*>(m.factor_scratch)) {}

  void one(const double* b, double* x) const {
    for (i64 k = 0; k < n_; ++k) w_[k] = b[perm_[k]];
    passes_.forward(rows_, w_, 0);
    passes_.backward(rows_, w_, 0);
    for (i64 k = 0; k < n_; ++k) x[perm_[k]] = w_[k];
  }

  // As many vectors as the passes take, in `lanes`: the room of x itself, or one that is free until later.
  void several(const LanePasses& passes, const double* b, double* x, double* lanes) const {
    passes.pack(order_, b, lanes);
    passes.forward(rows_, lanes, 0);
    passes.backward(rows_, lanes, 0);
    if (lanes == x) {
      passes.unpack_in_place(order_, x, w_);
    } else {
      passes.unpack(order_, lanes, x);
    }
  }

  // How many times as many vectors as there are lanes `leaves` takes; 0 where it is not the way.
  [[nodiscard]] i64 leaf_groups(const LanePasses& passes, i64 count) const {
    if (!leaves_.in_runs) return 0;
    const i64 most = n_ / std::max((n_ - leaves_.count) * passes.lanes, i64{1});
    return std::min(most, count / passes.lanes);
  }
  void leaves(const LanePasses& passes, i64 groups, const double* b, double* x) const {
    passes.solve_leaves(rows_, order_, {leaves_.count, groups, b, x, w_});
  }

  [[nodiscard]] const SubstitutionPasses& passes() const { return passes_; }

 private:
  i64 n_;
  const i64* perm_;
  RowOrder order_;
  FactorRows rows_;
  Leaves leaves_;
  double* w_;
  const SubstitutionPasses& passes_ = substitution_passes();
};

// Where a cache line begins, at `x` or before. The elements in between are the last of a vector, which unpack writes
// when it has read all lanes.
double* room_behind(double* x, i64 n) {
  if (n < i64{2} * kLanes) return x;
  return x - reinterpret_cast<std::uintptr_t>(x) % kLine / sizeof(double);
}

}  // namespace

// Vectors that have no room behind them go back in place, which takes longer: eight go first where sixteen find room by
// that.
void substitute_sparse(const SmMatrix& m, const double* b, double* x, i64 count) {
  const SparseSolve solve(m, count);
  const i64 n = m.rows;
  const auto take = [&](const LanePasses& passes, i64 vectors) {
    const i64 groups = solve.leaf_groups(passes, vectors);
    const i64 taken = passes.lanes * std::max(groups, i64{1});
    if (groups > 0) {
      solve.leaves(passes, groups, b, x);
    } else {
      solve.several(passes, b, x, count - taken >= taken ? room_behind(x + taken * n, n) : x);
    }
    count -= taken;
    b += taken * n;
    x += taken * n;
  };
  const LanePasses& wide = solve.passes().wide;
  const LanePasses& eight = solve.passes().eight;
  if (count > wide.lanes && count % wide.lanes >= eight.lanes) take(eight, eight.lanes);
  while (count >= wide.lanes) take(wide, count);
  while (count >= eight.lanes) take(eight, count);
  for (; count > 0; --count, b += n, x += n) solve.one(b, x);
}

}  // namespace sm
