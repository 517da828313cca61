// Strips from top to bottom. Within a strip the rows are solved for unscaled, v_i = t_i - sum of r_qi / r_qq v_q over
// the rows q above i, as the tile kernels do it, and divided by r_ii at the end.
#include "cholesky/band_solver.hpp"

namespace sm {

void BandSolver::pack_above(const Band& band, i64 r) {
  tiles_.pack(band.upper(band.first, band.first + r), r, -1.0, coefficients(r));
}

void BandSolver::pack_own(const Band& band, i64 r) {
  const i64 height = tiles_.height;
  double* coefficient = coefficients(r);
  const double* row = band.upper(band.first + r, band.first + r);
  for (i64 q = 0; q < height; ++q, row += kSlab) reciprocal_[r + q] = row[q] > 0.0 ? 1.0 / row[q] : 0.0;
  row -= height * kSlab;
  for (i64 q = 0; q < height; ++q, row += kSlab) {
    double* own = coefficient + (r + q) * height;
    for (i64 i = q + 1; i < height; ++i) own[i] = reciprocal_[r + q] > 0.0 ? -row[i] * reciprocal_[r + q] : 0.0;
  }
  for (i64 q = 0; q < height; ++q) {
    if (reciprocal_[r + q] > 0.0) continue;
    for (i64 s = 0; s < r + q; ++s) coefficient[s * height + q] = 0.0;
  }
}

void BandSolver::solve_strip(i64 r, double* rows, i64 from, i64 columns) const {
  const i64 height = tiles_.height;
  double* strip = rows + r * kSlab;
  for (i64 i = 0; i < height; ++i) {
    if (reciprocal_[r + i] == 0.0) std::fill_n(strip + i * kSlab, columns, 0.0);
  }
  tiles_.strip(coefficients(r) + from * height, r - from, rows + from * kSlab, strip, Finish::solve, columns);
  for (i64 i = 0; i < height; ++i) {
    const double reciprocal = reciprocal_[r + i];
    double* row = strip + i * kSlab;
    if (reciprocal == 0.0) {
      std::fill_n(row, columns, 0.0);  // 0 times what is not finite
    } else {
      for (i64 j = 0; j < columns; ++j) row[j] *= reciprocal;
    }
  }
}

SmStatus BandSolver::factor_corner(const Band& band, i64 r, const PackedPivots& pivots) const {
  const i64 height = tiles_.height;
  double* row = band.upper(band.first + r, band.first + r);
  for (i64 q = 0; q < height; ++q, row += kSlab) {
    const double d = row[q];
    double root = 0.0;
    SM_TRY(pivots.judge(band.first + r + q, d, root));
    if (root == 0.0) {
      std::fill(row + q, row + height, 0.0);
      continue;
    }
    for (i64 i = q + 1; i < height; ++i) {
      const double multiplier = row[i] / d;
      double* lower = row + (i - q) * kSlab;
      for (i64 j = i; j < height; ++j) lower[j] -= multiplier * row[j];
    }
    row[q] = root;
    for (i64 j = q + 1; j < height; ++j) row[j] /= root;
  }
  return SM_OK;
}

SmStatus BandSolver::factor(const Band& band, const PackedPivots& pivots) {
  width_ = band.width;
  const i64 height = tiles_.height;
  for (i64 r = 0; r < width_; r += height) {
    const i64 column = band.first + r;
    pack_above(band, r);
    tiles_.strip(coefficients(r), r, band.upper(band.first, column), band.upper(column, column), Finish::add, height);
    SM_TRY(factor_corner(band, r, pivots));
    pack_own(band, r);
    const i64 behind = column + height;
    const i64 next = Slabs::rounded(behind);  // the first slab behind this one
    if (behind < next) solve_strip(r, band.upper(band.first, behind), 0, next - behind);
    for (i64 c = next; c < band.end(); c += kSlab) solve_strip(r, band.upper(band.first, c), 0, kSlab);
  }
  return SM_OK;
}

void BandSolver::prepare(const Band& band) {
  width_ = band.width;
  for (i64 r = 0; r < width_; r += tiles_.height) {
    pack_above(band, r);
    pack_own(band, r);
  }
}

}  // namespace sm
