// The kernels for blocks of few rows with short tails, written once over the vector type of tiles_body.hpp, which is
// included first. Strips of register tiles would be mostly overhead there.
//
// Deliberately without an include guard.

// Rows of a block from its column 0 on, the same columns in the same vectors for all: what has just been stored is read
// as it was stored, which the processor does without waiting for the cache.
struct SmallRows {
  static constexpr i64 kStep = kMostSmallColumns;
  static constexpr int kWidth = X::kWidth;

  const Block& block;
  double* diag;
  Pivots& pivots;
  int vectors;
  int last;  // lanes of the last of them
  alignas(64) double row[kMostSmallRows * kStep];

  SmallRows(const Block& b, double* d, Pivots& p) : block(b), diag(d), pivots(p) {
    const int columns = static_cast<int>(b.length + 1);
    vectors = (columns + kWidth - 1) / kWidth;
    last = columns - (vectors - 1) * kWidth;
  }
};

// Row kRow += sum over the rows above of factor[q] * row q. Lanes up to the diagonal, which nobody reads, are words in
// front of the row: of rows above, and in front of the first value of all the last pivot, as `values` lies behind
// `diag` in the workspace.
template <int kRow>
SM_TILE_INLINE void add_rows_above(SmallRows& s, const double* factor) {
  using V = typename X::Vector;
  const double* from = s.block.row(kRow);
  for (int v = (kRow + 1) / SmallRows::kWidth; v < s.vectors; ++v) {
    const i64 at = v * X::kWidth;
    V total = v + 1 < s.vectors ? X::load(from + at) : X::load(from + at, s.last);
#pragma GCC unroll 8
    for (int q = 0; q < kRow; ++q) {
      total = X::fma(X::all(factor[q]), X::load(s.row + q * SmallRows::kStep + at), total);
    }
    X::store(s.row + kRow * SmallRows::kStep + at, total);
  }
}

// Row by row from row kRow on: what the rows above have for it, which turn into multipliers in its column, and its
// pivot.
template <int kRow>
SM_TILE_TARGET SmStatus factor_rows(SmallRows& s) {
  if constexpr (kRow < kMostSmallRows) {
    if (kRow == s.block.width) return SM_OK;
    double factor[kRow + 1];
    double d = s.diag[kRow];
    double* above = s.row + kRow;
#pragma GCC unroll 8
    for (int q = 0; q < kRow; ++q, above += SmallRows::kStep) {
      const double u = *above;
      factor[q] = -u * s.diag[q];
      d += u * factor[q];
    }
    add_rows_above<kRow>(s, factor);
    SM_TRY(s.pivots.judge(s.block.first + kRow, d, s.diag[kRow]));
    above = s.block.values + kRow - 1;
    const i64 step = s.block.length - 1;
#pragma GCC unroll 8
    for (int q = 0; q < kRow; above += step - q, ++q) *above = factor[q];
    return factor_rows<kRow + 1>(s);
  } else {
    return SM_OK;
  }
}

SM_TILE_INLINE void copy_row(const double* from, i64 n, double* to) {
  for (; n > X::kWidth; n -= X::kWidth, from += X::kWidth, to += X::kWidth) X::store(to, X::load(from));
  if (n > 0) X::store(to, X::load(from, static_cast<int>(n)), static_cast<int>(n));
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

// Some rows at a time are copied to where they begin on lines of the cache and end in zeros. from(r): row r of V behind
// the block's own columns.
template <class From>
SM_TILE_INLINE void add_square_of(const Block& b, const double* pivot, From from, double* sum) {
  using V = typename X::Vector;
  constexpr int kVectors = kMostSharedColumns / X::kWidth;
  alignas(64) double source[kMostSmallRows * kMostSharedColumns];
  alignas(64) double factor[kMostSmallRows * kMostSharedColumns];
  const i64 count = b.tail_length();
  for (i64 r = 0; r < b.width; r += kMostSmallRows) {
    const i64 depth = std::min(kMostSmallRows, b.width - r);
    for (i64 q = 0; q < depth; ++q) {
      const V scale = X::all(-pivot[r + q]);
      const double* value = from(r + q);
      double* out = b.row(r + q) + b.width;
#pragma GCC unroll 8
      for (int v = 0; v < kVectors; ++v) {
        const i64 at = v * X::kWidth;
        const int lanes = static_cast<int>(std::min(X::kWidth, count - at));
        const V row = lanes > 0 ? X::load(value + at, lanes) : X::zero();
        const V multipliers = X::fma(row, scale, X::zero());
        X::store(source + q * kMostSharedColumns + at, row);
        X::store(factor + q * kMostSharedColumns + at, multipliers);
        if (lanes > 0) X::store(out + at, multipliers, lanes);
      }
    }
    add_to_square(factor, source, depth, count, sum);
  }
}

SM_TILE_TARGET void add_square(const Block& b, const double* pivot, double* sum) {
  add_square_of(
      b, pivot, [&b](i64 r) SM_TILE_TARGET { return b.row(r) + b.width; }, sum);
}

SM_TILE_TARGET SmStatus factor_small(const Block& b, double* diag, Pivots& pivots, double* sum) {
  SmallRows s(b, diag, pivots);
  SM_TRY(factor_rows<0>(s));
  if (sum) {
    add_square_of(
        b, diag, [&s](i64 r) SM_TILE_TARGET { return s.row + r * SmallRows::kStep + s.block.width; }, sum);
    return SM_OK;
  }
  for (i64 r = 0; r < b.width; ++r)
    copy_row(s.row + r * SmallRows::kStep + b.width, b.tail_length(), b.row(r) + b.width);
  return SM_OK;
}
