// Vectors into lanes and back: part of substitution_body.hpp.
//
// Columns are read and written in their own order, eight rows at a time, and rows of lanes wherever the factor has
// them: so each cache line is touched once, and whole.
//
// Deliberately without an include guard.

SM_PASS_INLINE void transpose(Lanes (&t)[kLanes]) {
  Lanes s[kLanes];
#pragma GCC unroll 4
  for (int i = 0; i < kLanes; i += 2) {
    s[i] = __builtin_shufflevector(t[i], t[i + 1], 0, 8, 2, 10, 4, 12, 6, 14);
    s[i + 1] = __builtin_shufflevector(t[i], t[i + 1], 1, 9, 3, 11, 5, 13, 7, 15);
  }
#pragma GCC unroll 8
  for (int i = 0; i < kLanes; ++i) {
    const int a = i & ~2;
    t[i] = i & 2 ? __builtin_shufflevector(s[a], s[a + 2], 2, 3, 10, 11, 6, 7, 14, 15)
                 : __builtin_shufflevector(s[a], s[a + 2], 0, 1, 8, 9, 4, 5, 12, 13);
  }
#pragma GCC unroll 4
  for (int i = 0; i < kLanes / 2; ++i) {
    s[i] = __builtin_shufflevector(t[i], t[i + 4], 0, 1, 2, 3, 8, 9, 10, 11);
    s[i + 4] = __builtin_shufflevector(t[i], t[i + 4], 4, 5, 6, 7, 12, 13, 14, 15);
  }
#pragma GCC unroll 8
  for (int i = 0; i < kLanes; ++i) t[i] = s[i];
}

SM_PASS_INLINE Lanes& lanes_at(double* p) { return *reinterpret_cast<Lanes*>(p); }
SM_PASS_INLINE const Lanes& lanes_at(const double* p) { return *reinterpret_cast<const Lanes*>(p); }

// Eight elements of eight vectors, which are `apart`, as the lanes of eight rows.
SM_PASS_INLINE void read_eight(const double* from, i64 apart, Lanes (&t)[kLanes]) {
#pragma GCC unroll 8
  for (i64 v = 0; v < kLanes; ++v) t[v] = lanes_at(from + v * apart);
  transpose(t);
}

constexpr i64 kPlacesAhead = 32;  // rows whose places in the lanes are fetched early

// Of the eight rows that come kPlacesAhead after row i; kWrite is 1 where they will be written.
template <int kWide, int kWrite>
SM_PASS_INLINE void fetch_places(const RowOrder& order, const double* y, i64 i) {
  for (i64 r = 0; r < kLanes; ++r) {
    const double* ahead = y + order.place[std::min(i + kPlacesAhead + r, order.n - 1)] * kWide * kLanes;
    for (i64 h = 0; h < kWide; ++h) __builtin_prefetch(ahead + h * kLanes, kWrite);
  }
}

template <int kWide>
SM_PASS_TARGET void pack(const RowOrder& order, const double* b, double* y) {
  constexpr i64 kAll = i64{kWide} * kLanes;
  const i64 n = order.n;
  const i64* place = order.place;
  i64 i = 0;
  for (; i < n % kLanes; ++i) {
    for (i64 v = 0; v < kAll; ++v) y[place[i] * kAll + v] = b[i + v * n];
  }
  for (; i < n; i += kLanes) {
    fetch_places<kWide, 1>(order, y, i);
    for (i64 h = 0; h < kWide; ++h) {
      Lanes t[kLanes];
      read_eight(b + i + h * kLanes * n, n, t);
#pragma GCC unroll 8
      for (i64 r = 0; r < kLanes; ++r) lanes_at(y + place[i + r] * kAll + h * kLanes) = t[r];
    }
  }
}

// The lanes may begin in the last seven elements of x: the last eight rows are read before they are written there.
template <int kWide>
SM_PASS_TARGET void unpack(const RowOrder& order, const double* y, double* x) {
  constexpr i64 kAll = i64{kWide} * kLanes;
  const i64 n = order.n;
  const i64* place = order.place;
  i64 i = 0;
  for (; i < n % kLanes; ++i) {
    for (i64 v = 0; v < kAll; ++v) x[i + v * n] = y[place[i] * kAll + v];
  }
  for (; i < n; i += kLanes) {
    fetch_places<kWide, 0>(order, y, i);
    for (i64 h = 0; h < kWide; ++h) {
      Lanes t[kLanes];
#pragma GCC unroll 8
      for (i64 r = 0; r < kLanes; ++r) t[r] = lanes_at(y + place[i + r] * kAll + h * kLanes);
      transpose(t);
#pragma GCC unroll 8
      for (i64 v = 0; v < kLanes; ++v) lanes_at(x + i + (h * kLanes + v) * n) = t[v];
    }
  }
}

// `rows` rows of lanes: element v of row i goes to `to[v * rows + i]`.
template <int kWide>
SM_PASS_INLINE void rows_to_segments(const double* from, i64 rows, double* to) {
  constexpr i64 kAll = i64{kWide} * kLanes;
  i64 i = 0;
  for (; i + kLanes <= rows; i += kLanes) {
    for (i64 h = 0; h < kWide; ++h) {
      Lanes t[kLanes];
#pragma GCC unroll 8
      for (i64 r = 0; r < kLanes; ++r) t[r] = lanes_at(from + (i + r) * kAll + h * kLanes);
      transpose(t);
#pragma GCC unroll 8
      for (i64 v = 0; v < kLanes; ++v) lanes_at(to + (h * kLanes + v) * rows + i) = t[v];
    }
  }
  for (; i < rows; ++i) {
    for (i64 v = 0; v < kAll; ++v) to[v * rows + i] = from[i * kAll + v];
  }
}

// The rows are cut into as many chunks as there are lanes, so that the spare room takes a chunk. Each becomes segments,
// one for a lane: segment v of chunk j is in place (j, v) of a square. Column v of the square is what vector v needs:
// from the last on it is gathered in the spare room, in the order of x; then what row v has left moves to the places of
// the segments taken, which mirror its own, and the vector goes to where row v began, or a little behind. The few rows
// behind the chunks wait on the side.
template <int kWide>
SM_PASS_TARGET void unpack_in_place(const RowOrder& order, double* y, double* spare) {
  constexpr i64 kAll = i64{kWide} * kLanes;
  const i64 n = order.n;
  const i64 m = n / kAll;
  const i64 chunk = m * kAll;
  double behind[kAll * kAll];
  std::copy(y + chunk * kAll, y + n * kAll, behind);
  for (i64 j = 0; j < kAll; ++j) {
    std::copy_n(y + j * chunk, chunk, spare);
    rows_to_segments<kWide>(spare, m, y + j * chunk);
  }
  for (i64 v = kAll - 1; v >= 0; --v) {
    const i64* perm = order.perm;
    for (i64 j = 0; j < kAll; ++j, perm += m) {
      const double* segment = y + (j <= v ? j * chunk + v * m : v * chunk + j * m);
      for (i64 k = 0; k < m; ++k) spare[perm[k]] = segment[k];
    }
    for (i64 k = chunk; k < n; ++k) spare[order.perm[k]] = behind[(k - chunk) * kAll + v];
    for (i64 j = 0; j < v; ++j) std::copy_n(y + v * chunk + j * m, m, y + j * chunk + v * m);
    std::copy_n(spare, n, y + v * n);
  }
}
