// Rows that continue each other, for the passes of passes.hpp. Included behind passes_body.hpp, in the same namespace.
//
// Deliberately without an include guard.

// Rows of equal length whose columns are those of the row before moved by one, as stencils have, are a strip: `rows` of
// them from row i on, with `length` entries each from p on.
struct Strip {
  i64 i;
  i64 rows;
  i64 p;
  i64 length;
};

constexpr i64 kStripRows = 64;
constexpr i64 kStripEntries = 1024;  // which stay in the first cache
constexpr i64 kStripUnit = kSums;    // rows that are taken together
constexpr i64 kLeastStrip = 24;      // rows that are worth looking for in every product,
constexpr i64 kLeastListed = 8;      // and once for many
constexpr i64 kPatience = 32;        // rows after which they are looked for again, at most

// Whether v[k + step] is v[k] + more for k < count.
SM_PASS_INLINE bool climbs(const i64* v, i64 step, i64 more, i64 count) {
  i64 differs = 0;
  for (i64 k = 0; k < count; ++k) differs |= v[k + step] - v[k] - more;
  return differs == 0;
}

// How many rows from row i on, which begins at p, are a strip; 0 when it begins none.
SM_PASS_TARGET __attribute__((noinline)) i64 strip_rows(const UpperRows& a, i64 i, i64 p, i64 least) {
  const i64* start = a.row_start + i;
  const i64 length = start[1] - p;
  const i64* next = a.col_index + p + length;
  const i64 limit = std::min(a.rows - i, kStripRows);
  if (limit < least || length < 1 || start[least] - p != least * length || next[-length] != i ||
      next[length - 1] != next[-1] + 1) {
    return 0;  // most often
  }
  i64 rows = 0;
  while (rows + kStripUnit <= limit && climbs(start + rows, 1, length, kStripUnit)) rows += kStripUnit;
  rows = std::min(rows, kStripEntries / length & -kStripUnit);
  return rows >= least && climbs(a.col_index + p, length, 1, (rows - 1) * length) ? rows : 0;
}

// Eight values, each `l` behind the one before.
SM_PASS_INLINE void load_strided(const double* w, i64 l, Sums& v) {
  const double* z = w + 4 * l;
  v = Sums{w[0], w[l], w[2 * l], w[3 * l], z[0], z[l], z[2 * l], z[3 * l]};
}

// Every slot of the rows at once: the values are strided, the vectors are not. With a list the columns are left alone
// but for those of the first row.
template <bool kForm, class Turns>
SM_PASS_TARGET __attribute__((noinline)) void exchange_strip(const UpperRows& a, const Strip& s, const double* x,
                                                             double* y, Sums& form) {
  const double* const value = a.values + s.p;
  const i64* const column = a.col_index + s.p;
  const double* const xi = x + s.i;
  double* const yi = y + s.i;
  const i64 l = s.length;
  const i64 rows = s.rows;
  double sum[kStripRows];
  for (i64 r = 0; r < rows; r += kStripUnit) sums_at(sum + r) = Sums{};
  for (i64 e = 1; e < l; ++e) {
    const i64 k = column[e];
    for (i64 r = 0; r < rows; r += kStripUnit) {
      if (Turns::kReadsColumns) __builtin_prefetch(column + e * rows + r + kEntriesAhead);
      __builtin_prefetch(value + e * rows + r + kEntriesAhead);
      Sums v;
      load_strided(value + e + r * l, l, v);
      sums_at(sum + r) += v * sums_at(x + k + r);
      sums_at(y + k + r) += v * sums_at(xi + r);
    }
  }
  Sums part{};
  for (i64 r = 0; r < rows; r += kStripUnit) {
    if (Turns::kReadsColumns) __builtin_prefetch(column + r + kEntriesAhead);
    __builtin_prefetch(value + r + kEntriesAhead);
    Sums v;
    load_strided(value + r * l, l, v);
    const Sums t = sums_at(xi + r);
    const Sums diagonal = v * t;
    const Sums others = sums_at(sum + r);
    sums_at(yi + r) += diagonal + others;
    if constexpr (kForm) part += t * (diagonal + 2.0 * others);
  }
  if constexpr (kForm) form += part;
}
