// The passes of substitution.hpp, written once. A file that defines SM_PASS_TARGET, the attribute that lets the
// compiler use wider vectors, includes this in its own namespace.
//
// Deliberately without an include guard.

// Rows first .. first + kRows - 1 of a block. Column c of a row, counted from the block's own first column on, is at
// row[i][c], for c > first + i; those behind the strip have the numbers column[0 .. count).
template <int kRows>
struct Strip {
  const double* row[kRows];
  i64 inside;  // c of the strip's own first column
  i64 behind;  // c of column[0]
  const i64* column;
  i64 count;
};

template <int kRows>
SM_PASS_INLINE Strip<kRows> strip_of(const FactorRows& f, i64 block, i64 first) {
  const i64 length = f.iu[block + 1] - f.iu[block];
  const double* values = f.values + f.iu[block];
  Strip<kRows> s;
  for (int i = 0; i < kRows; ++i) {
    const i64 r = first - block + i;
    s.row[i] = values + r * length - r * (r - 1) / 2 - r - 1;
  }
  s.inside = first - block;
  s.behind = s.inside + kRows;
  s.column = f.ju + f.iju[block] + s.behind - 1;
  s.count = length + 1 - s.behind;
  return s;
}

constexpr int kMostRows = 8;
constexpr i64 kAhead = 128;

#include "cholesky/substitution_single.hpp"

// Eight vectors, one to a lane.
struct Several {
  static constexpr bool kNarrow = false;
  SM_PASS_INLINE static Lanes& at(double* y, i64 k) { return *reinterpret_cast<Lanes*>(y + k * kLanes); }

  template <int kRows>
  SM_PASS_INLINE static void forward(const FactorRows& f, const Strip<kRows>& s, i64 first, double* y) {
    Lanes w[kRows];
#pragma GCC unroll 8
    for (int i = 0; i < kRows; ++i) w[i] = at(y, first + i);
#pragma GCC unroll 8
    for (int i = 0; i < kRows; ++i) {
#pragma GCC unroll 8
      for (int j = i + 1; j < kRows; ++j) w[j] += s.row[i][s.inside + j] * w[i];
    }
    for (i64 c = 0; c < s.count; ++c) {
      Lanes sum = s.row[0][s.behind + c] * w[0];
#pragma GCC unroll 8
      for (int i = 1; i < kRows; ++i) sum += s.row[i][s.behind + c] * w[i];
      at(y, s.column[c]) += sum;
    }
#pragma GCC unroll 8
    for (int i = 0; i < kRows; ++i) at(y, first + i) = f.diag[first + i] * w[i];
  }

  template <int kRows>
  SM_PASS_INLINE static void backward(const Strip<kRows>& s, i64 first, double* y) {
    Lanes w[kRows];
#pragma GCC unroll 8
    for (int i = 0; i < kRows; ++i) w[i] = Lanes{};
    for (i64 c = 0; c < s.count; ++c) {
      const Lanes z = at(y, s.column[c]);
#pragma GCC unroll 8
      for (int i = 0; i < kRows; ++i) w[i] += s.row[i][s.behind + c] * z;
    }
#pragma GCC unroll 8
    for (int i = kRows - 1; i >= 0; --i) {
#pragma GCC unroll 8
      for (int j = i + 1; j < kRows; ++j) w[i] += s.row[i][s.inside + j] * w[j];
      w[i] += at(y, first + i);
      at(y, first + i) = w[i];
    }
  }
};

// A strip of `rows` <= kRows rows of a block.
template <class Road, int kRows = kMostRows>
SM_PASS_INLINE void forward_strip(Road& road, const FactorRows& f, i64 block, i64 first, i64 rows, double* y) {
  if constexpr (kRows > 1) {
    if (rows < kRows) {
      forward_strip<Road, kRows - 1>(road, f, block, first, rows, y);
      return;
    }
  }
  road.forward(f, strip_of<kRows>(f, block, first), first, y);
}

template <class Road, int kRows = kMostRows>
SM_PASS_INLINE void backward_strip(Road& road, const FactorRows& f, i64 block, i64 first, i64 rows, double* y) {
  if constexpr (kRows > 1) {
    if (rows < kRows) {
      backward_strip<Road, kRows - 1>(road, f, block, first, rows, y);
      return;
    }
  }
  road.backward(strip_of<kRows>(f, block, first), first, y);
}

// The same for a block of one strip with a short tail.
struct Narrow {
  SharedTail tail;

  static bool serves(const FactorRows& f, i64 block, i64 width) {
    return width <= kMostRows && f.length(block) + 1 - width <= SharedTail::kMost;
  }
  template <int kRows>
  SM_PASS_INLINE void forward(const FactorRows& f, const Strip<kRows>& s, i64 first, double* y) {
    Single::forward_narrow(f, s, first, tail, y);
  }
  template <int kRows>
  SM_PASS_INLINE void backward(const Strip<kRows>& s, i64 first, double* y) {
    Single::backward_narrow(s, first, tail, y);
  }
};
template <class Road>
SM_PASS_TARGET void forward_pass(const FactorRows& rows, double* y) {
  const FactorRows f = rows;
  Road road;
  Narrow narrow;
  for (i64 block = 0; block < f.n;) {
    const i64 end = f.end_of_block(block);
    if (Road::kNarrow && end - block > 1 && narrow.serves(f, block, end - block)) {
      forward_strip(narrow, f, block, block, end - block, y);
    } else {
      if (Road::kNarrow) narrow.tail.flush(y);
      if (end == block + 1) {
        road.forward(f, strip_of<1>(f, block, block), block, y);
      } else {
        for (i64 k = block; k < end; k += kMostRows)
          forward_strip(road, f, block, k, std::min<i64>(kMostRows, end - k), y);
      }
    }
    block = end;
  }
}

template <class Road>
SM_PASS_TARGET void backward_pass(const FactorRows& rows, double* y) {
  const FactorRows f = rows;
  Road road;
  Narrow narrow;
  for (i64 end = f.n; end > 0;) {
    i64 block = end - 1;
    while (block > 0 && f.continues(block - 1)) --block;
    if (end == block + 1) {
      road.backward(strip_of<1>(f, block, block), block, y);
    } else if (Road::kNarrow && narrow.serves(f, block, end - block)) {
      backward_strip(narrow, f, block, block, end - block, y);
    } else {
      for (i64 k = end; k > block;) {
        const i64 rows_of_strip = std::min<i64>(kMostRows, k - block);
        k -= rows_of_strip;
        backward_strip(road, f, block, k, rows_of_strip, y);
      }
    }
    end = block;
  }
}

constexpr SubstitutionPasses kPasses = {forward_pass<Single>, backward_pass<Single>, forward_pass<Several>,
                                        backward_pass<Several>};
