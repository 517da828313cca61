// Selected inversion of the rows of one block in a full square.
#include <algorithm>

#include "cholesky/inverse_work.hpp"

namespace sm {

double* strip_coefficients(const Block& u, const double* diag, i64 r, i64 rows, i64 begin, i64 end, double* out) {
  const i64 height = tile_kernels().strip_rows;
  const double* from[kMostStripRows];
  bool all = rows == height;
  for (i64 i = 0; i < rows; ++i) {
    from[i] = u.row(r + rows - 1 - i) + begin;
    all = all && is_accepted(diag[r + i]);
  }
  if (all) {
    tile_kernels().turn(from, end - begin, out, height);
  } else {
    for (i64 i = 0; i < rows; ++i) {
      const bool accepted = is_accepted(diag[r + rows - 1 - i]);
      for (i64 c = 0; c < end - begin; ++c) out[c * height + i] = accepted ? from[i][c] : 0.0;
    }
  }
  return out + (end - begin) * height;
}

void triangle_coefficients(const Block& u, const double* diag, i64 r, i64 rows, double* out) {
  const i64 height = tile_kernels().strip_rows;
  for (i64 i = 1; i < rows; ++i) {
    const i64 row = r + rows - 1 - i;
    const double* from = u.row(row);
    for (i64 q = 0; q < i; ++q) out[q * height + i] = is_accepted(diag[row]) ? from[r + rows - 1 - q] : 0.0;
  }
}

namespace {

// The square of the strip [begin, end) itself, which holds what the columns behind it add.
void solve_corner(const Block& u, const double* diag, const Square& z, i64 begin, i64 end) {
  for (i64 row = end - 1; row >= begin; --row) {
    const bool accepted = is_accepted(diag[row]);
    const double* v = u.row(row);
    double* to = z.row(row);
    for (i64 s = end - 1; s >= row; --s) {
      double sum = to[s];
      if (s == row && accepted) sum += diag[row];
      if (accepted) {
        for (i64 q = row + 1; q < end; ++q) sum += v[q] * z.row(q)[s];
      }
      to[s] = z.row(s)[row] = sum;
    }
  }
}

// The coefficients of a strip in columns [end, order) of the square.
double* square_coefficients(const Block& u, const double* diag, i64 r, i64 end, i64 order, const i64* place,
                            double* out) {
  const i64 rows = end - r;
  if (!place) return strip_coefficients(u, diag, r, rows, end, order, out);
  const i64 height = tile_kernels().strip_rows;
  out = strip_coefficients(u, diag, r, rows, end, u.width, out);
  std::fill_n(out, (order - u.width) * height, 0.0);
  for (i64 i = 0; i < rows; ++i) {
    const i64 row = end - 1 - i;
    if (!is_accepted(diag[row])) continue;
    const double* from = u.row(row) + u.width;
    for (i64 j = 0; j < u.tail_length(); ++j) out[place[j] * height + i] = from[j];
  }
  return out + (order - u.width) * height;
}

}  // namespace

// Strips of rows from the last to the first: a strip's rows behind it are -U times the square there, and then each of
// them takes the ones below it.
void solve_square(const Block& u, const double* diag, const Square& z, i64 order, const i64* place, InverseWork& work) {
  const TileKernels& tiles = tile_kernels();
  const i64 height = tiles.strip_rows;
  for (i64 r = (u.width - 1) / height * height; r >= 0; r -= height) {
    const i64 end = std::min(r + height, u.width);
    const int rows = static_cast<int>(end - r);
    const i64 depth = order - end;
    if (depth > 0) {
      double* own = square_coefficients(u, diag, r, end, order, place, work.coefficient);
      triangle_coefficients(u, diag, r, rows, own);
      double* target[kMostStripRows];
      for (int i = 0; i < rows; ++i) target[i] = z.row(end - 1 - i) + end;
      const TileSource behind = {z.row(end) + end, z.step, 0, tiles.tile_columns};
      tiles.strip(rows, depth, work.coefficient, behind, depth, target, Finish::solve);
      for (i64 k = end; k < order; ++k) {
        double* to = z.row(k);
        for (i64 s = r; s < end; ++s) to[s] = z.row(s)[k];
      }
      for (int i = 0; i < rows; ++i) target[i] = z.row(end - 1 - i) + r;
      const TileSource across = {z.row(end) + r, z.step, 0, tiles.tile_columns};
      tiles.strip(rows, depth, work.coefficient, across, rows, target, Finish::add);
    }
    solve_corner(u, diag, z, r, end);
  }
}

}  // namespace sm
