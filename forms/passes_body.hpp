// The passes of passes.hpp, written once. A file that defines SM_PASS_TARGET, the attribute that lets the compiler use
// wider vectors, includes this in its own namespace.
//
// Deliberately without an include guard.

#define SM_PASS_INLINE SM_PASS_TARGET __attribute__((always_inline)) inline

constexpr int kSums = 8;            // partial sums of a sweep over vectors
constexpr i64 kAhead = 256;         // elements that are made ready together, at least; the next as many are fetched
constexpr i64 kEntriesAhead = 384;  // of the entry at work: those that are fetched, faster than the processor would
constexpr i64 kLongRow = 8;         // entries from which a row is summed in several partial sums
constexpr i64 kRun = 64;            // neighbours that are taken together
constexpr i64 kRunsAhead = 5;       // runs from the one at work to that whose ends are fetched

typedef double Sums __attribute__((vector_size(kSums * sizeof(double)), aligned(sizeof(double)), may_alias));

SM_PASS_INLINE const Sums& sums_at(const double* v) { return *reinterpret_cast<const Sums*>(v); }
SM_PASS_INLINE Sums& sums_at(double* v) { return *reinterpret_cast<Sums*>(v); }

SM_PASS_INLINE double total_of(const Sums& s) {
  return ((s[0] + s[4]) + (s[2] + s[6])) + ((s[1] + s[5]) + (s[3] + s[7]));
}

// What follows in a vector, into the caches.
SM_PASS_INLINE void fetch(const double* v) {
  for (i64 j = 0; j < kAhead; j += 8) __builtin_prefetch(v + j);
}

SM_PASS_INLINE void fetch_entries(const UpperRows& a, i64 p) {
  __builtin_prefetch(a.col_index + p + kEntriesAhead);
  __builtin_prefetch(a.values + p + kEntriesAhead);
}

// What is made ready of the vectors: nothing, zeros of the result, or a piece of the direction besides.
struct Nothing {
  SM_PASS_INLINE void operator()(i64, i64) const {}
};
struct Cleared {
  const double* x;
  double* y;
  SM_PASS_INLINE void operator()(i64 from, i64 to) const {
    fetch(x + to);
    fetch(y + to);
    for (i64 j = from; j < to; ++j) y[j] = 0.0;
  }
};
struct Directed {
  const Direction& d;
  SM_PASS_INLINE void operator()(i64 from, i64 to) const {
    const double* __restrict inverse = d.inverse;
    const double* __restrict r = d.r;
    double* __restrict p = d.p;
    double* __restrict q = d.q;
    const double beta = d.beta;
    fetch(inverse + to);
    fetch(r + to);
    fetch(p + to);
    fetch(q + to);
    for (i64 j = from; j < to; ++j) {
      p[j] = inverse[j] * r[j] + beta * p[j];
      q[j] = 0.0;
    }
  }
};

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

// What the next rows are: so many of a strip, or, negative, so many others. Either by looking, less and less often
// where nothing is found, or from a list of that.
struct Look {
  static constexpr bool kReadsColumns = true;
  i64 least;
  i64 patience = 1;
  SM_PASS_INLINE i64 next(const UpperRows& a, i64 i, i64 p) {
    const i64 rows = strip_rows(a, i, p, least);
    if (rows > 0) {
      patience = 1;
      return rows;
    }
    const i64 others = std::min(a.rows - i, patience);
    patience = std::min<i64>(2 * patience, 32);
    return -others;
  }
};
struct Listed {
  static constexpr bool kReadsColumns = false;
  const i64* list;
  SM_PASS_INLINE i64 next(const UpperRows&, i64, i64) { return *list++; }
};

SM_PASS_TARGET void list_strips(const UpperRows& a, i64* list) {
  Look look{kLeastListed};
  i64* end = list;
  for (i64 i = 0; i < a.rows;) {
    const i64 rows = look.next(a, i, a.row_start[i]);
    if (rows < 0 && end != list && end[-1] < 0) {
      end[-1] += rows;
    } else {
      *end++ = rows;
    }
    i += std::abs(rows);
  }
}

// Eight values, each `l` behind the one before.
SM_PASS_INLINE void load_strided(const double* w, i64 l, Sums& v) {
  const double* z = w + 4 * l;
  v = Sums{w[0], w[l], w[2 * l], w[3 * l], z[0], z[l], z[2 * l], z[3 * l]};
}

// Every slot of the rows at once: the values are strided, the vectors are not. With a list the columns are left alone
// but for those of the first row.
template <bool kForm, class Strips>
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
      if (Strips::kReadsColumns) __builtin_prefetch(column + e * rows + r + kEntriesAhead);
      __builtin_prefetch(value + e * rows + r + kEntriesAhead);
      Sums v;
      load_strided(value + e + r * l, l, v);
      sums_at(sum + r) += v * sums_at(x + k + r);
      sums_at(y + k + r) += v * sums_at(xi + r);
    }
  }
  Sums part{};
  for (i64 r = 0; r < rows; r += kStripUnit) {
    if (Strips::kReadsColumns) __builtin_prefetch(column + r + kEntriesAhead);
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

// Entries p to `end` of a long row: several partial sums, so that none waits for the one before.
SM_PASS_INLINE double exchange_long(const UpperRows& a, i64& p, i64 end, double t, const double* x, double* y) {
  double part[4] = {};
  for (; p + 4 <= end; p += 4) {
    fetch_entries(a, p);
#pragma GCC unroll 4
    for (int e = 0; e < 4; ++e) {
      const i64 k = a.col_index[p + e];
      const double v = a.values[p + e];
      part[e] += v * x[k];
      y[k] += v * t;
    }
  }
  return (part[0] + part[2]) + (part[1] + part[3]);
}

// Whole runs of neighbours from entry p on, as far as they reach. Where columns ascend, the first and the last tell:
// those between are not even read.
SM_PASS_INLINE double exchange_runs(const UpperRows& a, i64& p, i64 end, double t, const double* x, double* y) {
  Sums part[2] = {};
  for (; p + kRun <= end; p += kRun) {
    const i64 k = a.col_index[p];
    if (a.col_index[p + kRun - 1] != k + kRun - 1) break;
    __builtin_prefetch(a.col_index + p + kRunsAhead * kRun);
    __builtin_prefetch(a.col_index + p + kRunsAhead * kRun + kRun - 1);
    for (i64 e = 0; e < kRun; e += i64{2} * kSums) {
      const double* v = a.values + p + e;
      __builtin_prefetch(v + kEntriesAhead);
      __builtin_prefetch(v + kEntriesAhead + kSums);
      part[0] += sums_at(v) * sums_at(x + k + e);
      part[1] += sums_at(v + kSums) * sums_at(x + k + e + kSums);
      sums_at(y + k + e) += sums_at(v) * t;
      sums_at(y + k + e + kSums) += sums_at(v + kSums) * t;
    }
  }
  return total_of(part[0] + part[1]);
}

// Entries p to `end` of a row that reaches a part of all columns, as those of a border do. Not inlined: the loop over
// short rows, which most are, keeps the registers.
SM_PASS_TARGET __attribute__((noinline)) double exchange_border(const UpperRows& a, i64 p, i64 end, double t,
                                                                const double* x, double* y) {
  double sum = 0.0;
  while (end - p >= kRun) {
    sum += exchange_runs(a, p, end, t, x, y);
    sum += exchange_long(a, p, std::min(end, p + 4 * kRun), t, x, y);
  }
  sum += exchange_long(a, p, end, t, x, y);
  for (; p < end; ++p) {
    const i64 k = a.col_index[p];
    sum += a.values[p] * x[k];
    y[k] += a.values[p] * t;
  }
  return sum;
}

// y += A x, with what it needs of the vectors made ready just before. Answers x'A x when asked: its terms come along.
template <bool kForm, class Strips, class Ready>
SM_PASS_INLINE double exchange_rows(const UpperRows& a, Strips strips, const double* x, double* y,
                                    const Ready& make_ready) {
  const i64* __restrict start = a.row_start;
  const i64* __restrict column = a.col_index;
  const double* __restrict value = a.values;
  const i64 n = a.rows;
  double form = 0.0;
  Sums forms{};
  i64 ready = 0;
  if (!a.is_ascending) make_ready(0, ready = n);
  for (i64 i = 0, p = start[0]; i < n;) {
    const i64 rows = strips.next(a, i, p);
    if (rows > 0) {
      const i64 length = start[i + 1] - p;
      if (const i64 last = column[p + length - 1] + rows - 1; last >= ready) {
        const i64 from = ready;
        ready = std::min(n, last + kAhead);
        make_ready(from, ready);
      }
      exchange_strip<kForm, Strips>(a, {i, rows, p, length}, x, y, forms);
      p += rows * length;
      i += rows;
      continue;
    }
    for (const i64 until = i - rows; i < until; ++i) {
      const i64 end = start[i + 1];
      if (p == end) continue;
      if (const i64 last = column[end - 1]; last >= ready) {
        const i64 from = ready;
        ready = std::min(n, last + kAhead);
        make_ready(from, ready);
      }
      fetch_entries(a, p);
      const double t = x[i];
      double diagonal = 0.0;
      if (column[p] == i) diagonal = value[p++] * t;
      double sum = 0.0;
      if (end - p >= kLongRow) {
        if (end - p >= kRun && a.is_ascending) {
          sum = exchange_border(a, p, end, t, x, y);
          p = end;
        } else {
          sum = exchange_long(a, p, end, t, x, y);
        }
      }
      for (; p < end; ++p) {
        const i64 k = column[p];
        const double v = value[p];
        sum += v * x[k];
        y[k] += v * t;
      }
      y[i] += diagonal + sum;
      if constexpr (kForm) form += t * (diagonal + 2.0 * sum);
    }
  }
  make_ready(ready, n);
  return form + total_of(forms);
}

SM_PASS_TARGET void multiply_one(const UpperRows& a, const double* x, double* y, bool accumulate) {
  if (accumulate) {
    exchange_rows<false>(a, Look{kLeastStrip}, x, y, Nothing{});
  } else {
    exchange_rows<false>(a, Look{kLeastStrip}, x, y, Cleared{x, y});
  }
}

SM_PASS_TARGET double direct(const UpperRows& a, const i64* strips, const Direction& d) {
  return exchange_rows<true>(a, Listed{strips}, d.p, d.q, Directed{d});
}

SM_PASS_TARGET double advance(const Step& s) {
  const double* __restrict p = s.p;
  const double* __restrict q = s.q;
  const double* __restrict inverse = s.inverse;
  double* __restrict x = s.x;
  double* __restrict r = s.r;
  const double alpha = s.alpha;
  Sums rho{};
  i64 i = 0;
  for (; i + kSums <= s.n; i += kSums) {
    sums_at(x + i) += sums_at(p + i) * alpha;
    const Sums rest = sums_at(r + i) - sums_at(q + i) * alpha;
    sums_at(r + i) = rest;
    rho += rest * (sums_at(inverse + i) * rest);
  }
  for (int lane = 0; i < s.n; ++i, ++lane) {
    x[i] += alpha * p[i];
    r[i] -= alpha * q[i];
    rho[lane] += r[i] * (inverse[i] * r[i]);
  }
  return total_of(rho);
}

SM_PASS_TARGET double measure(i64 n, const double* b, const double* q, const double* inverse, double* r) {
  Sums rho{};
  i64 i = 0;
  for (; i + kSums <= n; i += kSums) {
    const Sums rest = sums_at(b + i) - sums_at(q + i);
    sums_at(r + i) = rest;
    rho += rest * (sums_at(inverse + i) * rest);
  }
  for (int lane = 0; i < n; ++i, ++lane) {
    r[i] = b[i] - q[i];
    rho[lane] += r[i] * (inverse[i] * r[i]);
  }
  return total_of(rho);
}
