// Solves with a sparse factor: vectors into the order of the factor, two passes, and back.
#include <algorithm>
#include <cstdint>

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

constexpr std::uintptr_t kLine = 64;  // bytes: that of eight lanes
static_assert(kLine == kLanes * sizeof(double));

class SparseSolve {
 public:
  explicit SparseSolve(const SmMatrix& m)
      : n_(m.rows),
        perm_(m.perm),
        order_{m.rows, m.perm, m.inv_perm},
        rows_(m),
        w_(reinterpret_cast<double*>(m.factor_scratch)) {}

  void one(const double* b, double* x) const {
    for (i64 k = 0; k < n_; ++k) w_[k] = b[perm_[k]];
    passes_.forward(rows_, w_);
    passes_.backward(rows_, w_);
    for (i64 k = 0; k < n_; ++k) x[perm_[k]] = w_[k];
  }

  // As many vectors as the passes take, in `lanes`: the room of x itself, or one that is free until later.
  void several(const LanePasses& passes, const double* b, double* x, double* lanes) const {
    passes.pack(order_, b, lanes);
    passes.forward(rows_, lanes);
    passes.backward(rows_, lanes);
    if (lanes == x) {
      passes.unpack_in_place(order_, x, w_);
    } else {
      passes.unpack(order_, lanes, x);
    }
  }

  [[nodiscard]] const SubstitutionPasses& passes() const { return passes_; }

 private:
  i64 n_;
  const i64* perm_;
  RowOrder order_;
  FactorRows rows_;
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
  const SparseSolve solve(m);
  const i64 n = m.rows;
  const auto take = [&](const LanePasses& passes) {
    const i64 elements = passes.lanes * n;
    solve.several(passes, b, x, count - passes.lanes >= passes.lanes ? room_behind(x + elements, n) : x);
    count -= passes.lanes;
    b += elements;
    x += elements;
  };
  const LanePasses& wide = solve.passes().wide;
  const LanePasses& eight = solve.passes().eight;
  if (count > wide.lanes && count % wide.lanes >= eight.lanes) take(eight);
  while (count >= wide.lanes) take(wide);
  while (count >= eight.lanes) take(eight);
  for (; count > 0; --count, b += n, x += n) solve.one(b, x);
}

}  // namespace sm
