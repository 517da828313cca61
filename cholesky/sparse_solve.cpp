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

}  // namespace

void substitute_sparse(const SmMatrix& m, const double* b, double* x, i64 count) {
  const SparseSolve solve(m);
  for (const LanePasses* passes : {&solve.passes().wide, &solve.passes().eight}) {
    const i64 lanes = passes->lanes;
    for (; count >= lanes; count -= lanes, b += lanes * m.rows, x += lanes * m.rows) {
      solve.several(*passes, b, x, count - lanes >= lanes ? x + lanes * m.rows : x);
    }
  }
  for (; count > 0; --count, b += m.rows, x += m.rows) solve.one(b, x);
}

}  // namespace sm
