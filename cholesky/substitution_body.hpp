// The passes of substitution.hpp, written once. A file that defines SM_PASS_TARGET, the attribute that lets the
// compiler use wider vectors, includes this in its own namespace.
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
  SM_PASS_INLINE const double* at(int i) const { return row + i * step - i * (i - 1) / 2; }

  const double* row;
  i64 step;
  const i64* column;
  i64 count;
};

constexpr i64 kAhead = 128;
constexpr i64 kSubs = 128;
constexpr i64 kRowsAhead = 64;
constexpr i64 kSingleAhead = 512;
constexpr i64 kFarAhead = 512;

SM_PASS_INLINE void fetch_row_words(const FactorRows& f, i64 k) {
  __builtin_prefetch(f.iu + k);
  __builtin_prefetch(f.iju + k);
  __builtin_prefetch(f.diag + k);
}

#include "cholesky/substitution_single.hpp"

// Eight vectors, one to a lane.
struct Several {
  SM_PASS_INLINE static Lanes& at(double* y, i64 k) { return *reinterpret_cast<Lanes*>(y + k * kLanes); }
  template <int kRows>
  SM_PASS_INLINE static void fetch(const FactorRows& f, const Strip<kRows>& s, i64 first, i64 way) {
    if constexpr (kRows == 1) {
      Single::fetch_single(s, way * kSingleAhead);
    } else {
      if (s.count > SharedTail::kMost) return;
      Single::fetch_rows(s, way * kFarAhead);
      fetch_row_words(f, first + way * kRowsAhead);
    }
  }
  template <int kRows>
  SM_PASS_INLINE static void fetch_column(const Strip<kRows>& s, i64 c) {
    if constexpr (kRows > 3) __builtin_prefetch(s.row + c % kRows * s.step + c + kAhead);
  }

  template <int kRows>
  SM_PASS_INLINE static void forward(const FactorRows& f, const Strip<kRows>& s, i64 first, double* y) {
    Lanes w[kRows];
#pragma GCC unroll 8
    for (int i = 0; i < kRows; ++i) w[i] = at(y, first + i);
#pragma GCC unroll 8
    for (int i = 0; i < kRows; ++i) {
#pragma GCC unroll 8
      for (int j = i + 1; j < kRows; ++j) w[j] += s.at(i)[j] * w[i];
    }
    fetch<kRows>(f, s, first, 1);
    for (i64 c = 0; c < s.count; ++c) {
      fetch_column(s, c);
      Lanes sum = s.at(0)[kRows + c] * w[0];
#pragma GCC unroll 8
      for (int i = 1; i < kRows; ++i) sum += s.at(i)[kRows + c] * w[i];
      at(y, s.column[c]) += sum;
    }
#pragma GCC unroll 8
    for (int i = 0; i < kRows; ++i) at(y, first + i) = f.diag[first + i] * w[i];
  }

  template <int kRows>
  SM_PASS_INLINE static void backward(const FactorRows& f, const Strip<kRows>& s, i64 first, double* y) {
    Lanes w[kRows];
#pragma GCC unroll 8
    for (int i = 0; i < kRows; ++i) w[i] = Lanes{};
    fetch<kRows>(f, s, first, -1);
    for (i64 c = 0; c < s.count; ++c) {
      fetch_column(s, c);
      const Lanes z = at(y, s.column[c]);
#pragma GCC unroll 8
      for (int i = 0; i < kRows; ++i) w[i] += s.at(i)[kRows + c] * z;
    }
#pragma GCC unroll 8
    for (int i = kRows - 1; i >= 0; --i) {
      w[i] += at(y, first + i);
#pragma GCC unroll 8
      for (int j = kRows - 1; j > i; --j) w[i] += s.at(i)[j] * w[j];
      at(y, first + i) = w[i];
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

template <class Road>
SM_PASS_TARGET void forward_pass(const FactorRows& given, double* y) {
  const FactorRows f = given;
  Road road;
  for (i64 k = 0; k < f.n;) {
    const i64 rows = Access::rows_from(f, k);
    if (rows == 1) {
      road.forward(f, Strip<1>(f, k), k, y);
      ++k;
    } else {
      k += forward_strip(road, f, k, rows, y);
    }
  }
}

template <class Road>
SM_PASS_TARGET void backward_pass(const FactorRows& given, double* y) {
  const FactorRows f = given;
  Road road;
  for (i64 k = f.n; k > 0;) {
    const i64 rows = Access::rows_to(f, k);
    if (rows == 1) {
      --k;
      road.backward(f, Strip<1>(f, k), k, y);
    } else {
      k -= backward_strip(road, f, k, rows, y);
    }
  }
}

constexpr SubstitutionPasses kPasses = {forward_pass<Single>, backward_pass<Single>, forward_pass<Several>,
                                        backward_pass<Several>};
