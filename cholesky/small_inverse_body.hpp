// The kernel of the selected inversion for blocks of few rows with short tails, after tiles_body.hpp and
// small_body.hpp.
//
// With V for -U of the block, V = [N T] on its own columns and on the tail, and Z on the tail at hand:
//   Y = T Z on the tail,   S = D^- + T Y';   the block's rows of the inverse are N~ Y on the tail, N~ S N~' on its own
// columns, where N~ x is x + N x from the last row up. Rows whose pivot was dropped count as zeros.
//
// Deliberately without an include guard.

constexpr double kNoRow[kMostSmallColumns] = {};

struct SmallInverse {
  static constexpr i64 kStep = kMostSmallColumns;
  static constexpr i64 kOwnStep = kMostSmallRows;

  int width;
  i64 tail;
  const double* v[kMostSmallRows];  // rows of V from the block's column 0 on
  alignas(64) double y[kMostSmallRows * kStep];
  alignas(64) double turned[kStep * kOwnStep];
  alignas(64) double own[kMostSmallRows * kOwnStep];
  alignas(64) double own_turned[kMostSmallRows * kOwnStep];
};

// to[i] = sum over j < depth of factor[i][j] * row j of the source, one vector of each.
template <int kRows>
SM_TILE_INLINE void few_sums(const double* const* factor, i64 skip, i64 depth, const double* source, i64 step,
                             double* to, i64 to_step) {
  using V = typename X::Vector;
  V total[kRows];
#pragma GCC unroll 8
  for (int i = 0; i < kRows; ++i) total[i] = X::zero();
  for (i64 j = 0; j < depth; ++j, source += step) {
    const V row = X::load(source);
#pragma GCC unroll 8
    for (int i = 0; i < kRows; ++i) total[i] = X::fma(X::all(factor[i][skip + j]), row, total[i]);
  }
#pragma GCC unroll 8
  for (int i = 0; i < kRows; ++i) X::store(to + i * to_step, total[i]);
}

// The same for `rows` rows and whole vectors that hold `columns` columns.
SM_TILE_TARGET void many_sums(int rows, const double* const* factor, i64 skip, i64 depth, const double* source,
                              i64 step, i64 columns, double* to, i64 to_step) {
  for (i64 c = 0; c < columns; c += X::kWidth) {
    int i = 0;
    for (; i + 4 <= rows; i += 4) {
      few_sums<4>(factor + i, skip, depth, source + c, step, to + i * to_step + c, to_step);
    }
    for (; i + 2 <= rows; i += 2) {
      few_sums<2>(factor + i, skip, depth, source + c, step, to + i * to_step + c, to_step);
    }
    if (i < rows) few_sums<1>(factor + i, skip, depth, source + c, step, to + i * to_step + c, to_step);
  }
}

// From the last row up each takes the ones below it.
SM_TILE_TARGET void add_rows_below(const SmallInverse& s, i64 columns, double* row, i64 step) {
  using V = typename X::Vector;
  for (i64 c = 0; c < columns; c += X::kWidth) {
    for (int r = s.width - 2; r >= 0; --r) {
      V total = X::load(row + r * step + c);
      for (int q = s.width - 1; q > r; --q) total = X::fma(X::all(s.v[r][q]), X::load(row + q * step + c), total);
      X::store(row + r * step + c, total);
    }
  }
}

SM_TILE_TARGET void invert_small(const Block& u, const double* diag, const double* behind, const Block* out,
                                 double* out_diag) {
  SmallInverse s;
  s.width = static_cast<int>(u.width);
  s.tail = u.tail_length();
  for (int r = 0; r < s.width; ++r) s.v[r] = diag[r] > 0.0 ? u.row(r) : kNoRow;
  many_sums(s.width, s.v, s.width, s.tail, behind, kMostSmallTail, s.tail, s.y, SmallInverse::kStep);
  for (i64 j = 0; j < s.tail; ++j) {
    double* to = s.turned + j * SmallInverse::kOwnStep;
    for (int r = 0; r < s.width; ++r) to[r] = s.y[r * SmallInverse::kStep + j];
    for (int r = s.width; r < SmallInverse::kOwnStep; ++r) to[r] = 0.0;
  }
  many_sums(s.width, s.v, s.width, s.tail, s.turned, SmallInverse::kOwnStep, s.width, s.own, SmallInverse::kOwnStep);
  for (int r = 0; r < s.width; ++r) {
    if (diag[r] > 0.0) s.own[r * SmallInverse::kOwnStep + r] += diag[r];
  }
  add_rows_below(s, s.width, s.own, SmallInverse::kOwnStep);
  for (int r = 0; r < s.width; ++r) {
    double* to = s.own_turned + r * SmallInverse::kOwnStep;
    for (int c = 0; c < s.width; ++c) to[c] = s.own[c * SmallInverse::kOwnStep + r];
    for (int c = s.width; c < SmallInverse::kOwnStep; ++c) to[c] = 0.0;
  }
  add_rows_below(s, s.width, s.own_turned, SmallInverse::kOwnStep);
  for (int r = 0; r < s.width; ++r) {
    const double* from = s.own_turned + r * SmallInverse::kOwnStep;
    out_diag[r] = from[r];
    if (out) std::copy(from + r + 1, from + s.width, out->row(r) + r + 1);
  }
  if (!out) return;
  add_rows_below(s, s.tail, s.y, SmallInverse::kStep);
  for (int r = 0; r < s.width; ++r) copy_row(s.y + r * SmallInverse::kStep, s.tail, out->row(r) + s.width);
}
