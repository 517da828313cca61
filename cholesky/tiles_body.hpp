// The tile kernels, written once over a vector type. A file that defines SM_TILE_TARGET (the attribute that lets the
// compiler use the instructions) and, in its own namespace, a struct X includes this there:
//   X::Vector; X::kWidth lanes, X::kRows rows of a strip, X::kVectors vectors of a tile's row; zero, all(x), load(p),
//   load(p, n) and store(p, v), store(p, v, n) for the first n lanes only, fma(a, b, c) = a * b + c, add(a, b);
//   turn(square) of kWidth vectors, whose rows become columns.
//
// Deliberately without an include guard.

// The last vector of a row has `last` lanes; kFull says that it has them all.
template <bool kFull, class V>
SM_TILE_INLINE V load_last(const double* p, int last) {
  if constexpr (kFull) return X::load(p);
  return X::load(p, last);
}

constexpr i64 kWorthFetching = 8;  // source rows that take longer than a target line from the next cache

// What a tile adds to, under way while its sums are made.
template <int kTileRows, int kTileVectors>
SM_TILE_INLINE void fetch_targets(double* const* target, i64 column) {
#pragma GCC unroll 8
  for (int i = 0; i < kTileRows; ++i) {
    const double* row = target[i] + column;
#pragma GCC unroll 8
    for (i64 j = 0; j < kTileVectors * X::kWidth; j += 8) __builtin_prefetch(row + j, 1);
    __builtin_prefetch(row + kTileVectors * X::kWidth - 1, 1);
  }
}

template <int kTileRows, int kTileVectors, bool kFull>
SM_TILE_TARGET void tile(i64 depth, const double* coefficient, const double* source, i64 step, i64 shrink, int last,
                         double* const* target, i64 column, Finish finish) {
  using V = typename X::Vector;
  if (depth >= kWorthFetching && finish != Finish::store) fetch_targets<kTileRows, kTileVectors>(target, column);
  V sum[kTileRows][kTileVectors];
#pragma GCC unroll 8
  for (int i = 0; i < kTileRows; ++i) {
#pragma GCC unroll 8
    for (int v = 0; v < kTileVectors; ++v) sum[i][v] = X::zero();
  }
  for (i64 s = 0; s < depth; ++s) {
    V row[kTileVectors];
#pragma GCC unroll 8
    for (int v = 0; v + 1 < kTileVectors; ++v) row[v] = X::load(source + v * X::kWidth);
    row[kTileVectors - 1] = load_last<kFull, V>(source + (kTileVectors - 1) * X::kWidth, last);
#pragma GCC unroll 8
    for (int i = 0; i < kTileRows; ++i) {
      const V factor = X::all(coefficient[i]);
#pragma GCC unroll 8
      for (int v = 0; v < kTileVectors; ++v) sum[i][v] = X::fma(factor, row[v], sum[i][v]);
    }
    coefficient += X::kRows;
    source += step;
    step -= shrink;
  }
  if (finish != Finish::store) {
#pragma GCC unroll 8
    for (int i = 0; i < kTileRows; ++i) {
      const double* old = target[i] + column;
#pragma GCC unroll 8
      for (int v = 0; v + 1 < kTileVectors; ++v) sum[i][v] = X::add(sum[i][v], X::load(old + v * X::kWidth));
      sum[i][kTileVectors - 1] =
          X::add(sum[i][kTileVectors - 1], load_last<kFull, V>(old + (kTileVectors - 1) * X::kWidth, last));
    }
  }
  if (finish == Finish::solve) {
#pragma GCC unroll 8
    for (int q = 0; q + 1 < kTileRows; ++q) {
#pragma GCC unroll 8
      for (int i = q + 1; i < kTileRows; ++i) {
        const V factor = X::all(coefficient[q * X::kRows + i]);
#pragma GCC unroll 8
        for (int v = 0; v < kTileVectors; ++v) sum[i][v] = X::fma(factor, sum[q][v], sum[i][v]);
      }
    }
  }
#pragma GCC unroll 8
  for (int i = 0; i < kTileRows; ++i) {
    double* out = target[i] + column;
#pragma GCC unroll 8
    for (int v = 0; v + 1 < kTileVectors; ++v) X::store(out + v * X::kWidth, sum[i][v]);
    if constexpr (kFull) {
      X::store(out + (kTileVectors - 1) * X::kWidth, sum[i][kTileVectors - 1]);
    } else {
      X::store(out + (kTileVectors - 1) * X::kWidth, sum[i][kTileVectors - 1], last);
    }
  }
}

// The columns of a strip behind its last full tile.
template <int kTileRows, int kTileVectors>
SM_TILE_TARGET void tile_rest(i64 depth, const double* coefficient, const double* source, const TileSource& s,
                              i64 columns, double* const* target, i64 column, Finish finish) {
  if constexpr (kTileVectors > 1) {
    if (columns <= (kTileVectors - 1) * X::kWidth) {
      tile_rest<kTileRows, kTileVectors - 1>(depth, coefficient, source, s, columns, target, column, finish);
      return;
    }
  }
  tile<kTileRows, kTileVectors, false>(depth, coefficient, source, s.step, s.shrink,
                                       static_cast<int>(columns - (kTileVectors - 1) * X::kWidth), target, column,
                                       finish);
}

template <int kTileRows>
SM_TILE_TARGET void strip_of(i64 depth, const double* coefficient, const TileSource& source, i64 columns,
                             double* const* target, Finish finish) {
  constexpr i64 kColumns = X::kVectors * X::kWidth;
  const double* tile_source = source.first;
  i64 column = 0;
  for (; column + kColumns <= columns; column += kColumns, tile_source += source.tile_step) {
    tile<kTileRows, X::kVectors, true>(depth, coefficient, tile_source, source.step, source.shrink, 0, target, column,
                                       finish);
  }
  if (column < columns) {
    tile_rest<kTileRows, X::kVectors>(depth, coefficient, tile_source, source, columns - column, target, column,
                                      finish);
  }
}

template <int kTileRows>
SM_TILE_TARGET void strip_up_to(int rows, i64 depth, const double* coefficient, const TileSource& source, i64 columns,
                                double* const* target, Finish finish) {
  if constexpr (kTileRows > 1) {
    if (rows < kTileRows) {
      strip_up_to<kTileRows - 1>(rows, depth, coefficient, source, columns, target, finish);
      return;
    }
  }
  strip_of<kTileRows>(depth, coefficient, source, columns, target, finish);
}

SM_TILE_TARGET void strip(int rows, i64 depth, const double* coefficient, const TileSource& source, i64 columns,
                          double* const* target, Finish finish) {
  strip_up_to<X::kRows>(rows, depth, coefficient, source, columns, target, finish);
}

// Row by row, as the source lies in memory.
SM_TILE_TARGET void pack(i64 depth, const double* first, i64 step, i64 columns, double* panel) {
  constexpr i64 kColumns = X::kVectors * X::kWidth;
  for (i64 s = 0; s < depth; ++s) {
    double* out = panel + s * kColumns;
    i64 j = 0;
    for (; j + kColumns <= columns; j += kColumns, out += depth * kColumns) {
      for (i64 t = 0; t < kColumns; t += 8) __builtin_prefetch(first + step + j + t);  // of the next row
#pragma GCC unroll 8
      for (int v = 0; v < X::kVectors; ++v) X::store(out + v * X::kWidth, X::load(first + j + v * X::kWidth));
    }
    if (j < columns) {
      for (i64 t = 0; t < kColumns; ++t) out[t] = j + t < columns ? first[j + t] : 0.0;
    }
    first += step;
    --step;
  }
}

template <int kTogether>
SM_TILE_TARGET void multiply_few_rows(const i64* place, const double* v, const double* first, i64 step, i64 columns,
                                      double* y, bool add) {
  using V = typename X::Vector;
  V factor[kTogether];
  const double* row[kTogether];
#pragma GCC unroll 4
  for (int i = 0; i < kTogether; ++i) {
    factor[i] = X::all(v[i]);
    row[i] = first + place[i] * step;
  }
  i64 c = 0;
  for (; c + X::kWidth <= columns; c += X::kWidth) {
    V sum = add ? X::load(y + c) : X::zero();
#pragma GCC unroll 4
    for (int i = 0; i < kTogether; ++i) sum = X::fma(factor[i], X::load(row[i] + c), sum);
    X::store(y + c, sum);
  }
  if (c == columns) return;
  const int last = static_cast<int>(columns - c);
  V sum = add ? X::load(y + c, last) : X::zero();
#pragma GCC unroll 4
  for (int i = 0; i < kTogether; ++i) sum = X::fma(factor[i], X::load(row[i] + c, last), sum);
  X::store(y + c, sum, last);
}

// The rows one behind the other, in the order in which they lie in memory, four at a time.
SM_TILE_TARGET void multiply_rows(i64 rows, const i64* place, const double* v, const double* first, i64 step,
                                  i64 columns, double* y) {
  if (rows == 0) std::fill_n(y, columns, 0.0);
  i64 i = 0;
  for (; i + 4 <= rows; i += 4) multiply_few_rows<4>(place + i, v + i, first, step, columns, y, i > 0);
  if (i + 2 <= rows) {
    multiply_few_rows<2>(place + i, v + i, first, step, columns, y, i > 0);
    i += 2;
  }
  if (i < rows) multiply_few_rows<1>(place + i, v + i, first, step, columns, y, i > 0);
}

// In squares of a vector's width; a strip has as many rows, or several times as many.
SM_TILE_TARGET void turn(const double* const* row, i64 columns, double* out, i64 step) {
  i64 c = 0;
  for (; c + X::kWidth <= columns; c += X::kWidth, out += X::kWidth * step) {
#pragma GCC unroll 2
    for (i64 first = 0; first < X::kRows; first += X::kWidth) {
      typename X::Vector square[X::kWidth];
#pragma GCC unroll 8
      for (i64 i = 0; i < X::kWidth; ++i) square[i] = X::load(row[first + i] + c);
      X::turn(square);
#pragma GCC unroll 8
      for (i64 i = 0; i < X::kWidth; ++i) X::store(out + i * step + first, square[i]);
    }
  }
  for (; c < columns; ++c, out += step) {
    for (int i = 0; i < X::kRows; ++i) out[i] = row[i][c];
  }
}

// One by one, as most vectors have no instruction for it.
[[maybe_unused]] inline i64 expand_plain(const i64* column, i64 columns, const i64* own, i64 own_count,
                                         const double* value, double* panel, i64 tile_step) {
  constexpr i64 kColumns = X::kVectors * X::kWidth;
  i64 found = 0;
  for (i64 j = 0; j < columns; j += kColumns, panel += tile_step) {
    const i64 end = std::min(kColumns, columns - j);
    i64 x = 0;
    for (; x < end && found < own_count; ++x) {
      const bool has = own[found] == column[j + x];
      panel[x] = has ? value[found] : 0.0;
      found += has;
    }
    for (; x < kColumns; ++x) panel[x] = 0.0;
  }
  return found;
}

SM_TILE_TARGET void spread(int rows, const double* sums, i64 sums_step, i64 first, const Run* run, const Run* end,
                           double* const* target) {
  for (; run != end; ++run) {
    const i64 skipped = run->from < first ? first - run->from : 0;
    const i64 length = run->length - skipped;
    if (length <= 0) continue;
    const double* from = sums + (run->from + skipped - first);
    const i64 to = run->to + skipped;
    for (int i = 0; i < rows; ++i, from += sums_step) {
      double* out = target[i] + to;
      i64 x = 0;
      for (; x + X::kWidth <= length; x += X::kWidth) X::store(out + x, X::add(X::load(out + x), X::load(from + x)));
      for (; x < length; ++x) out[x] += from[x];
    }
  }
}
