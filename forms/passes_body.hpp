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

// Entries p to `end` of a row, off the diagonal: what they give the row itself.
SM_PASS_INLINE double exchange_row(const UpperRows& a, i64 p, i64 end, double t, const double* x, double* y) {
  double sum = 0.0;
  if (end - p >= kLongRow) {
    if (end - p >= kRun && a.is_ascending) return exchange_border(a, p, end, t, x, y);
    sum = exchange_long(a, p, end, t, x, y);
  }
  for (; p < end; ++p) {
    const i64 k = a.col_index[p];
    const double v = a.values[p];
    sum += v * x[k];
    y[k] += v * t;
  }
  return sum;
}
