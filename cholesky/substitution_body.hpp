// The passes of substitution.hpp, written once. A file that defines SM_PASS_TARGET, the attribute that lets the
// compiler use wider vectors, SM_PASS_INLINE, the same for what is inlined, and Access (substitution_access.hpp)
// includes this in its own namespace.
//
// Deliberately without an include guard.

// Rows first .. first + kRows - 1 of one structure. What row i has in column first + c is at at(i)[c], i < c < kRows;
// at(i)[kRows + c] is in column[c], c < count.
template <int kRows>
struct Strip {
  SM_PASS_INLINE Strip(const FactorRows& f, i64 first)
      : row(f.values + f.iu[first] - 1),
        step(f.length(first) - 1),
        column(f.columns(first) + kRows - 1),
        count(f.length(first) + 1 - kRows) {}
  SM_PASS_INLINE const double* at(i64 i) const { return row + i * step - i * (i - 1) / 2; }

  const double* row;
  i64 step;
  const i64* column;
  i64 count;
};

constexpr i64 kNarrowTail = 32;  // whole vectors

// Blocks follow each other without a gap, but the rows of one are several streams, and the next one is over before the
// CPU has seen that it is one: so what comes is fetched by hand. Distances are in elements, taken from measurements;
// fetching beyond an array reads nothing.
constexpr i64 kWideAhead = 128;     // in each row of a wide strip
constexpr i64 kNarrowAhead = 512;   // values of narrow strips, and of single rows
constexpr i64 kColumnsAhead = 128;  // their subscripts
constexpr i64 kRowsAhead = 64;
constexpr i64 kSinglesAhead = 16;  // rows whose places in y are fetched, with lanes

// Way is 1 going forward and -1 going backward.
template <int kRows>
SM_PASS_INLINE void fetch_narrow(const FactorRows& f, const Strip<kRows>& s, i64 first, i64 way) {
  const double* from = s.at(0) + 1 + way * kNarrowAhead;
  const double* end = s.at(kRows - 1) + kRows + s.count + way * kNarrowAhead;
  for (; from < end; from += kLanes) __builtin_prefetch(from);
  __builtin_prefetch(s.column + way * kColumnsAhead);
  __builtin_prefetch(s.column + way * kColumnsAhead + kLanes);
  __builtin_prefetch(f.iu + first + way * kRowsAhead);
  __builtin_prefetch(f.iju + first + way * kRowsAhead);
  __builtin_prefetch(f.diag + first + way * kRowsAhead);
}

template <int kRows>
SM_PASS_INLINE void fetch_rows(const double* const (&row)[kRows], i64 c) {
#pragma GCC unroll 8
  for (int i = 0; i < kRows; ++i) __builtin_prefetch(row[i] + c + kWideAhead);
}

SM_PASS_INLINE void fetch_single(const Strip<1>& s, i64 way) {
  __builtin_prefetch(s.at(0) + 1 + way * kNarrowAhead);
  __builtin_prefetch(s.column + way * kNarrowAhead);
}

#include "cholesky/substitution_single.hpp"

// kWide times eight vectors, one to a lane. What a row of U holds is spread over the lanes once for all of them.
template <int kWide>
struct Several {
  SM_PASS_INLINE static Lanes* at(double* y, i64 k) { return reinterpret_cast<Lanes*>(y + k * kWide * kLanes); }
  template <int kRows>
  SM_PASS_INLINE static void fetch(const FactorRows& f, const Strip<kRows>& s, i64 first, i64 way) {
    if constexpr (kRows == 1) {
      fetch_single(s, way);
    } else {
      if (s.count <= kNarrowTail) fetch_narrow(f, s, first, way);
    }
  }
  // The block that follows, as if it were of the same size: a line of it, or less, for each column of this one.
  template <int kRows>
  SM_PASS_INLINE static void fetch_next(const Strip<kRows>& s, i64 c, i64 way) {
    if constexpr (kRows > 3) __builtin_prefetch(s.row + (way * s.count + c) * kRows);
  }
  // What a single row to come will need of y: as many of its columns as the strip at hand has. Where it has none, or is
  // not there, the strip at hand stands in.
  class Ahead {
   public:
    template <int kRows>
    SM_PASS_INLINE Ahead(const FactorRows& f, const Strip<kRows>& s, i64 row) {
      const bool there = row >= 0 && row < f.n && f.length(row) > 0;
      column_ = there ? f.columns(row) : s.column;
      last_ = (there ? f.length(row) : s.count) - 1;
    }
    SM_PASS_INLINE void fetch(double* y, i64 c) const {
      const Lanes* to = at(y, column_[std::min(c, last_)]);
#pragma GCC unroll 8
      for (int h = 0; h < kWide; ++h) __builtin_prefetch(to + h);
    }

   private:
    const i64* column_;
    i64 last_;
  };

  // What the rows of a strip become by each other, row `first` at `own`.
  template <int kRows>
  SM_PASS_INLINE static void descend(const Strip<kRows>& s, double* own, Lanes (&w)[kRows][kWide]) {
#pragma GCC unroll 8
    for (int i = 0; i < kRows; ++i) {
#pragma GCC unroll 8
      for (int h = 0; h < kWide; ++h) w[i][h] = at(own, i)[h];
    }
#pragma GCC unroll 8
    for (int i = 0; i < kRows; ++i) {
#pragma GCC unroll 8
      for (int j = i + 1; j < kRows; ++j) {
#pragma GCC unroll 8
        for (int h = 0; h < kWide; ++h) w[j][h] += s.at(i)[j] * w[i][h];
      }
    }
  }
  template <int kRows>
  SM_PASS_INLINE static void put_scaled(const double* diag, const Lanes (&w)[kRows][kWide], double* own) {
#pragma GCC unroll 8
    for (int i = 0; i < kRows; ++i) {
#pragma GCC unroll 8
      for (int h = 0; h < kWide; ++h) at(own, i)[h] = diag[i] * w[i][h];
    }
  }

  template <int kRows>
  SM_PASS_INLINE static void forward(const FactorRows& f, const Strip<kRows>& s, i64 first, double* y) {
    Lanes w[kRows][kWide];
    double* own = y + first * kWide * kLanes;
    descend(s, own, w);
    add_to_tail(f, s, first, w, y);
    put_scaled(f.diag + first, w, own);
  }
  template <int kRows>
  SM_PASS_INLINE static void add_to_tail(const FactorRows& f, const Strip<kRows>& s, i64 first,
                                         const Lanes (&w)[kRows][kWide], double* y) {
    fetch<kRows>(f, s, first, 1);
    const Ahead ahead(f, s, first + kSinglesAhead);
    for (i64 c = 0; c < s.count; ++c) {
      if constexpr (kRows == 1) {
        ahead.fetch(y, c);
      } else {
        fetch_next(s, c, 1);
      }
      Lanes sum[kWide];
#pragma GCC unroll 8
      for (int i = 0; i < kRows; ++i) {
        const double u = s.at(i)[kRows + c];
#pragma GCC unroll 8
        for (int h = 0; h < kWide; ++h) sum[h] = i == 0 ? u * w[i][h] : sum[h] + u * w[i][h];
      }
      Lanes* to = at(y, s.column[c]);
#pragma GCC unroll 8
      for (int h = 0; h < kWide; ++h) to[h] += sum[h];
    }
  }

  template <int kRows>
  SM_PASS_INLINE static void backward(const FactorRows& f, const Strip<kRows>& s, i64 first, double* y) {
    ascend(f, s, first, y, y + first * kWide * kLanes);
  }
  template <int kRows>
  SM_PASS_INLINE static void ascend(const FactorRows& f, const Strip<kRows>& s, i64 first, double* y, double* own) {
    Lanes w[kRows][kWide];
#pragma GCC unroll 8
    for (int i = 0; i < kRows; ++i) {
#pragma GCC unroll 8
      for (int h = 0; h < kWide; ++h) w[i][h] = Lanes{};
    }
    fetch<kRows>(f, s, first, -1);
    const Ahead ahead(f, s, first - kSinglesAhead);
    for (i64 c = 0; c < s.count; ++c) {
      if constexpr (kRows == 1) {
        ahead.fetch(y, c);
      } else {
        fetch_next(s, c, -1);
      }
      const Lanes* from = at(y, s.column[c]);
      Lanes z[kWide];
#pragma GCC unroll 8
      for (int h = 0; h < kWide; ++h) z[h] = from[h];
#pragma GCC unroll 8
      for (int i = 0; i < kRows; ++i) {
        const double u = s.at(i)[kRows + c];
#pragma GCC unroll 8
        for (int h = 0; h < kWide; ++h) w[i][h] += u * z[h];
      }
    }
#pragma GCC unroll 8
    for (int i = kRows - 1; i >= 0; --i) {
#pragma GCC unroll 8
      for (int h = 0; h < kWide; ++h) {
        w[i][h] += at(own, i)[h];
#pragma GCC unroll 8
        for (int j = kRows - 1; j > i; --j) w[i][h] += s.at(i)[j] * w[j][h];
        at(own, i)[h] = w[i][h];
      }
    }
  }
};

// A strip of `rows` <= kRows rows.
template <class Road, int kRows = kStripRows>
SM_PASS_INLINE i64 forward_strip(Road& road, const FactorRows& f, i64 first, i64 rows, double* y) {
  if constexpr (kRows > 1) {
    if (rows < kRows) {
      return forward_strip<Road, kRows - 1>(road, f, first, rows, y);
    }
  }
  road.forward(f, Strip<kRows>(f, first), first, y);
  return kRows;
}

template <class Road, int kRows = kStripRows>
SM_PASS_INLINE i64 backward_strip(Road& road, const FactorRows& f, i64 end, i64 rows, double* y) {
  if constexpr (kRows > 1) {
    if (rows < kRows) {
      return backward_strip<Road, kRows - 1>(road, f, end, rows, y);
    }
  }
  road.backward(f, Strip<kRows>(f, end - kRows), end - kRows, y);
  return kRows;
}

// The rows from `first` on, where a block begins.
template <class Road>
SM_PASS_TARGET void forward_pass(const FactorRows& given, double* y, i64 first) {
  const FactorRows f = given;
  Road road;
  for (i64 k = first; k < f.n;) {
    const i64 rows = f.rows_from(k);
    if (rows == 1) {
      road.forward(f, Strip<1>(f, k), k, y);
      ++k;
    } else {
      k += forward_strip(road, f, k, rows, y);
    }
  }
}

template <class Road>
SM_PASS_TARGET void backward_pass(const FactorRows& given, double* y, i64 first) {
  const FactorRows f = given;
  Road road;
  for (i64 k = f.n; k > first;) {
    const i64 rows = f.rows_to(k);
    if (rows == 1) {
      --k;
      road.backward(f, Strip<1>(f, k), k, y);
    } else {
      k -= backward_strip(road, f, k, rows, y);
    }
  }
}

#include "cholesky/substitution_leaves.hpp"

template <int kWide>
constexpr LanePasses kLanePasses = {kWide* kLanes,
                                    pack<kWide>,
                                    forward_pass<Several<kWide>>,
                                    backward_pass<Several<kWide>>,
                                    unpack<kWide>,
                                    unpack_in_place<kWide>,
                                    solve_leaves<kWide>};

constexpr SubstitutionPasses kPasses = {forward_pass<Single>, backward_pass<Single>, kLanePasses<Access::kWide>,
                                        kLanePasses<1>};
