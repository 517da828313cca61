// Solves with a sparse factor: vectors into the order of the factor, two passes, and back.
#include <algorithm>

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

class SparseSolve {
 public:
  explicit SparseSolve(const SmMatrix& m)
      : n_(m.rows), perm_(m.perm), rows_(m), w_(reinterpret_cast<double*>(m.factor_scratch)) {}

  void one(const double* b, double* x) const {
    for (i64 k = 0; k < n_; ++k) w_[k] = b[perm_[k]];
    passes_.forward(rows_, w_);
    passes_.backward(rows_, w_);
    for (i64 k = 0; k < n_; ++k) x[perm_[k]] = w_[k];
  }

  // kLanes vectors in `lanes`, kLanes * n doubles: those of x itself, or others that are free until later.
  void several(const double* b, double* x, double* lanes) const {
    for (i64 k = 0; k < n_; ++k) {
      const double* ahead = b + perm_[std::min(k + kAhead, n_ - 1)];
      for (int v = 0; v < kLanes; ++v) __builtin_prefetch(ahead + v * n_);
      for (int v = 0; v < kLanes; ++v) lanes[k * kLanes + v] = b[perm_[k] + v * n_];
    }
    passes_.forward_lanes(rows_, lanes);
    passes_.backward_lanes(rows_, lanes);
    if (lanes == x) {
      unpack_in_place(x);
      return;
    }
    for (i64 k = 0; k < n_; ++k) {
      const double* ahead = x + perm_[std::min(k + kAhead, n_ - 1)];
      for (int v = 0; v < kLanes; ++v) __builtin_prefetch(ahead + v * n_, 1);
      for (int v = 0; v < kLanes; ++v) x[perm_[k] + v * n_] = lanes[k * kLanes + v];
    }
  }

 private:
  static constexpr i64 kAhead = 16;  // rows whose places in b or x are fetched early

  // The last lane goes to the scratch, the others move together, and it takes the room that they left, which is its
  // own; then the next.
  void unpack_in_place(double* x) const {
    for (int lane = kLanes - 1; lane > 0; --lane) {
      for (i64 k = 0; k < n_; ++k) {
        const double* from = x + k * (lane + 1);
        double* to = x + k * lane;
        const double last = from[lane];
        for (int v = 0; v < lane; ++v) to[v] = from[v];
        w_[perm_[k]] = last;
      }
      std::copy_n(w_, n_, x + lane * n_);
    }
    for (i64 k = 0; k < n_; ++k) w_[perm_[k]] = x[k];
    std::copy_n(w_, n_, x);
  }

  i64 n_;
  const i64* perm_;
  FactorRows rows_;
  double* w_;
  const SubstitutionPasses& passes_ = substitution_passes();
};

}  // namespace

void substitute_sparse(const SmMatrix& m, const double* b, double* x, i64 count) {
  const SparseSolve solve(m);
  const i64 group = kLanes * m.rows;
  for (; count >= kLanes; count -= kLanes, b += group, x += group) {
    solve.several(b, x, count - kLanes >= kLanes ? x + group : x);
  }
  for (; count > 0; --count, b += m.rows, x += m.rows) solve.one(b, x);
}

}  // namespace sm
