// The factorization of a block: strips of rows from top to bottom, first on the block's own columns, where the pivots
// are, then on the columns behind it, a panel at a time that stays in the second-level cache for all strips.
#include <algorithm>

#include "cholesky/block_work.hpp"

namespace sm {

namespace {

class BlockFactor {
 public:
  BlockFactor(const Block& block, double* diag, Pivots& pivots, Panels& panels)
      : b_(block), diag_(diag), pivots_(pivots), panels_(panels), tiles_(tile_kernels()), height_(tiles_.strip_rows) {}
  SmStatus run();

 private:
  // Of the strip that begins at row r: r rows of the block above it, then its own.
  double* coefficients(i64 r) { return panels_.coefficient + r / height_ * (r + height_) / 2 * height_; }
  i64 rows_of(i64 r) const { return std::min(height_, b_.width - r); }
  void find_coefficients(i64 r);
  void update_triangle(i64 r);
  SmStatus factor_triangle(i64 r);
  void finish(i64 r, i64 begin, i64 end);

  const Block& b_;
  double* diag_;
  Pivots& pivots_;
  Panels& panels_;
  const TileKernels& tiles_;
  i64 height_;
};

// Multipliers of the rows above the strip; those take the place of the raw values, which are kept in sums until the
// strip's triangle has been updated.
void BlockFactor::find_coefficients(i64 r) {
  double* out = coefficients(r);
  for (i64 s = 0; s < r; ++s, out += height_) {
    const double* v = b_.row(s) + r;
    const double d = -diag_[b_.first + s];
    for (i64 i = 0; i < rows_of(r); ++i) out[i] = v[i] * d;
  }
}

// The strip's own columns: everything from the rows above, which then turn into multipliers there.
void BlockFactor::update_triangle(i64 r) {
  const int rows = static_cast<int>(rows_of(r));
  double* sums[kMostStripRows];
  for (int i = 0; i < rows; ++i) sums[i] = panels_.sums + i * kPanelColumns;
  tiles_.strip(rows, r, coefficients(r), {b_.row(0) + r, b_.length - 1, 1, 0}, rows, sums, Finish::store);
  for (int i = 0; i < rows; ++i) {
    double* row = b_.row(r + i) + r;
    diag_[b_.first + r + i] += sums[i][i];
    for (int j = i + 1; j < rows; ++j) row[j] += sums[i][j];
  }
  const double* multiplier = coefficients(r);
  for (i64 s = 0; s < r; ++s, multiplier += height_) std::copy_n(multiplier, rows, b_.row(s) + r);
}

SmStatus BlockFactor::factor_triangle(i64 r) {
  const i64 rows = rows_of(r);
  double* coefficient = coefficients(r) + r * height_;
  double* diag = diag_ + b_.first + r;
  for (i64 q = 0; q < rows; ++q, coefficient += height_) {
    double* row = b_.row(r + q) + r;
    SM_TRY(pivots_.judge(b_.first + r + q, diag[q], diag[q]));
    for (i64 i = q + 1; i < rows; ++i) {
      const double multiplier = -row[i] * diag[q];
      coefficient[i] = multiplier;
      double* lower = b_.row(r + i) + r;
      diag[i] += row[i] * multiplier;
      for (i64 j = i + 1; j < rows; ++j) lower[j] += row[j] * multiplier;
    }
    std::copy(coefficient + q + 1, coefficient + rows, row + q + 1);
  }
  return SM_OK;
}

// Places [begin, end) of the strip's rows.
void BlockFactor::finish(i64 r, i64 begin, i64 end) {
  if (begin >= end) return;
  const int rows = static_cast<int>(rows_of(r));
  double* row[kMostStripRows];
  for (int i = 0; i < rows; ++i) row[i] = b_.row(r + i) + begin;
  const TileSource source = {b_.row(0) + begin, b_.length - 1, 1, tiles_.tile_columns};
  tiles_.strip(rows, r, coefficients(r), source, end - begin, row, Finish::solve);
}

SmStatus BlockFactor::run() {
  for (i64 r = 0; r < b_.width; r += height_) {
    if (r > 0) {
      find_coefficients(r);
      update_triangle(r);
    }
    SM_TRY(factor_triangle(r));
    finish(r, r + rows_of(r), b_.width);
  }
  const i64 places = b_.length + 1;
  for (i64 begin = b_.width; begin < places; begin += kPanelColumns) {
    const i64 end = std::min(begin + kPanelColumns, places);
    for (i64 r = 0; r < b_.width; r += height_) finish(r, begin, end);
  }
  return SM_OK;
}

}  // namespace

SmStatus factor_block(const Block& block, double* diag, double* square, Pivots& pivots, Panels& panels) {
  const TileKernels& tiles = tile_kernels();
  double* own_diag = diag + block.first;
  if (block.width <= kMostSmallRows && block.length < kMostSmallColumns) {
    return tiles.factor_small(block, own_diag, pivots, square);
  }
  SM_TRY(BlockFactor(block, diag, pivots, panels).run());
  if (square) tiles.add_square(block, own_diag, square);
  return SM_OK;
}

}  // namespace sm
