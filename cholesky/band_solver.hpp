// The diagonal block of a band: its factorization, and R'^- on rows of the band.
#pragma once

#include "cholesky/packed_roads.hpp"
#include "cholesky/slabs.hpp"
#include "store/layouts.hpp"

namespace sm {

// Judges by the diagonal of the caller's array, which is A until the end.
class PackedPivots {
 public:
  explicit PackedPivots(const PackedJob& job) : job_(job) {}
  [[nodiscard]] SmStatus judge(i64 k, double d, double& r) const {
    r = 0.0;
    if (k >= job_.n) return SM_OK;
    const i64 p = with_packed(job_.format, job_.n, [&](auto layout) { return layout.diagonal(k); });
    return find_root(job_.array[p], job_.tolerance, d, r);
  }

 private:
  const PackedJob& job_;
};

class BandSolver {
 public:
  explicit BandSolver(const SlabTiles& tiles) : tiles_(tiles) {}
  // The diagonal block becomes R, all updates from the rows above being in.
  [[nodiscard]] SmStatus factor(const Band& band, const PackedPivots& pivots);
  // Takes the diagonal block of an R as it is.
  void prepare(const Band& band);
  // The band's rows in a slab, which are 0 before row `from`, become R'^- times them. A dropped row takes nothing and
  // gives nothing: it becomes 0, whatever it was.
  void solve(double* rows, i64 from) const {
    for (i64 r = from; r < width_; r += tiles_.height) solve_strip(r, rows, from, kSlab);
  }

 private:
  // Of the strip at row r: r rows of the band above it, then its own.
  double* coefficients(i64 r) { return coefficient_ + r * (r + tiles_.height) / 2; }
  const double* coefficients(i64 r) const { return coefficient_ + r * (r + tiles_.height) / 2; }
  void pack_above(const Band& band, i64 r);
  void pack_own(const Band& band, i64 r);
  void solve_strip(i64 r, double* rows, i64 from, i64 columns) const;
  [[nodiscard]] SmStatus factor_corner(const Band& band, i64 r, const PackedPivots& pivots) const;

  const SlabTiles& tiles_;
  i64 width_ = 0;
  alignas(64) double coefficient_[kBand * (kBand + kMostStripRows) / 2];
  double reciprocal_[kBand];  // 1 / r_kk, 0 for a dropped pivot
};

}  // namespace sm
