// The kernels for blocks of few rows with short tails, written once over the vector type of tiles_body.hpp, which is
// included first. Strips of register tiles would be mostly overhead there.
//
// Deliberately without an include guard.

// p[0, n) += sum over q < kDepth of factor[q] * row q's same columns; the rows begin at `source`, their distance being
// `step` and falling by one from row to row.
template <int kDepth>
SM_TILE_INLINE void add_few_rows(double* p, i64 n, const double* source, i64 step, const double* factor) {
  using V = typename X::Vector;
  for (; n > X::kWidth; n -= X::kWidth, p += X::kWidth, source += X::kWidth) {
    V sum = X::load(p);
    const double* from = source;
#pragma GCC unroll 8
    for (int q = 0; q < kDepth; from += step - q, ++q) sum = X::fma(X::all(factor[q]), X::load(from), sum);
    X::store(p, sum);
  }
  if (n <= 0) return;
  const int last = static_cast<int>(n);
  V sum = X::load(p, last);
#pragma GCC unroll 8
  for (int q = 0; q < kDepth; source += step - q, ++q) sum = X::fma(X::all(factor[q]), X::load(source, last), sum);
  X::store(p, sum, last);
}

// Row by row from row kRow on: what the rows above have for it, which turn into multipliers in its column, and its
// pivot.
template <int kRow>
SM_TILE_TARGET SmStatus factor_rows(const Block& b, double* diag, Pivots& pivots) {
  if constexpr (kRow < kMostSmallRows) {
    if (kRow == b.width) return SM_OK;
    double factor[kRow + 1];
    const i64 step = b.length - 1;
    double d = diag[kRow];
    double* above = b.values + kRow - 1;  // the row's column in the first row
#pragma GCC unroll 8
    for (int q = 0; q < kRow; above += step - q, ++q) {
      const double u = *above;
      *above = factor[q] = -u * diag[q];
      d += u * factor[q];
    }
    SM_TRY(pivots.judge(b.first + kRow, d, diag[kRow]));
    add_few_rows<kRow>(b.row(kRow) + kRow + 1, b.length - kRow, b.values + kRow, step, factor);
    return factor_rows<kRow + 1>(b, diag, pivots);
  } else {
    return SM_OK;
  }
}

SM_TILE_TARGET SmStatus factor_small(const Block& b, double* diag, Pivots& pivots) {
  return factor_rows<0>(b, diag, pivots);
}

// Some rows of the square, and a few vectors of their columns.
template <int kTileRows, int kVectors>
SM_TILE_TARGET inline void square_tile(const double* factor, const double* source, i64 depth, double* sum) {
  using V = typename X::Vector;
  V total[kTileRows][kVectors];
#pragma GCC unroll 8
  for (int i = 0; i < kTileRows; ++i) {
#pragma GCC unroll 2
    for (int v = 0; v < kVectors; ++v) total[i][v] = X::load(sum + i * kMostSharedColumns + v * X::kWidth);
  }
  for (i64 q = 0; q < depth; ++q, factor += kMostSharedColumns, source += kMostSharedColumns) {
    V row[kVectors];
#pragma GCC unroll 2
    for (int v = 0; v < kVectors; ++v) row[v] = X::load(source + v * X::kWidth);
#pragma GCC unroll 8
    for (int i = 0; i < kTileRows; ++i) {
#pragma GCC unroll 2
      for (int v = 0; v < kVectors; ++v) total[i][v] = X::fma(X::all(factor[i]), row[v], total[i][v]);
    }
  }
#pragma GCC unroll 8
  for (int i = 0; i < kTileRows; ++i) {
#pragma GCC unroll 2
    for (int v = 0; v < kVectors; ++v) X::store(sum + i * kMostSharedColumns + v * X::kWidth, total[i][v]);
  }
}

// The rows that are left of the square, a whole strip or one that is half as high until it is too low.
template <int kTileRows>
SM_TILE_TARGET inline void square_strip(const double* factor, const double* source, i64 depth, i64 rows, i64 columns,
                                        double* sum) {
  if constexpr (kTileRows > 2) {
    if (rows <= kTileRows / 2) {
      square_strip<kTileRows / 2>(factor, source, depth, rows, columns, sum);
      return;
    }
  }
  constexpr i64 kPair = 2 * X::kWidth;
  for (; columns > X::kWidth; columns -= kPair, source += kPair, sum += kPair) {
    square_tile<kTileRows, 2>(factor, source, depth, sum);
  }
  if (columns > 0) square_tile<kTileRows, 1>(factor, source, depth, sum);
}

// The upper triangle of a square += factor' source, in whole tiles: more than the triangle, and zeros behind `count`.
SM_TILE_TARGET inline void add_to_square(const double* factor, const double* source, i64 depth, i64 count,
                                         double* sum) {
  for (i64 j = 0; j < count; j += X::kRows) {
    const i64 column = j / X::kWidth * X::kWidth;
    square_strip<X::kRows>(factor + j, source + column, depth, count - j, count - column,
                           sum + j * kMostSharedColumns + column);
  }
}

// Some rows at a time are copied to where they begin on lines of the cache and end in zeros.
SM_TILE_TARGET void add_square(i64 width, i64 count, double* value, i64 step, const double* pivot, double* sum) {
  using V = typename X::Vector;
  constexpr int kVectors = kMostSharedColumns / X::kWidth;
  alignas(64) double source[kMostSmallRows * kMostSharedColumns];
  alignas(64) double factor[kMostSmallRows * kMostSharedColumns];
  for (i64 r = 0; r < width; r += kMostSmallRows) {
    const i64 depth = std::min(kMostSmallRows, width - r);
    for (i64 q = 0; q < depth; ++q) {
      const V scale = X::all(-pivot[r + q]);
#pragma GCC unroll 8
      for (int v = 0; v < kVectors; ++v) {
        const i64 from = v * X::kWidth;
        const int lanes = static_cast<int>(std::min(X::kWidth, count - from));
        const V row = lanes > 0 ? X::load(value + from, lanes) : X::zero();
        const V multipliers = X::fma(row, scale, X::zero());
        X::store(source + q * kMostSharedColumns + from, row);
        X::store(factor + q * kMostSharedColumns + from, multipliers);
        if (lanes > 0) X::store(value + from, multipliers, lanes);
      }
      value += step - (r + q);
    }
    add_to_square(factor, source, depth, count, sum);
  }
}
