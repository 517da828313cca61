// The passes of substitution.hpp, written once. A file that defines SM_PASS_TARGET, the attribute that lets the
// compiler use wider vectors, includes this in its own namespace.
//
// Deliberately without an include guard.

typedef double Lanes __attribute__((vector_size(kLanes * sizeof(double)), aligned(sizeof(double)), may_alias));

#define SM_PASS_INLINE SM_PASS_TARGET __attribute__((always_inline)) inline

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

// One vector. Behind the strip eight columns are taken together.
struct Single {
  template <int kRows>
  SM_PASS_INLINE static void forward(const FactorRows& f, const Strip<kRows>& s, i64 first, double* y) {
    double w[kRows];
    for (int i = 0; i < kRows; ++i) w[i] = y[first + i];
#pragma GCC unroll 8
    for (int i = 0; i < kRows; ++i) {
#pragma GCC unroll 8
      for (int j = i + 1; j < kRows; ++j) w[j] += s.row[i][s.inside + j] * w[i];
    }
    i64 c = 0;
    if constexpr (kRows > 1) {
      for (; c + kLanes <= s.count; c += kLanes) {
        Lanes sum = *reinterpret_cast<const Lanes*>(s.row[0] + s.behind + c) * w[0];
#pragma GCC unroll 8
        for (int i = 1; i < kRows; ++i) sum += *reinterpret_cast<const Lanes*>(s.row[i] + s.behind + c) * w[i];
#pragma GCC unroll 8
        for (int q = 0; q < kLanes; ++q) y[s.column[c + q]] += sum[q];
      }
    }
    for (; c < s.count; ++c) {
      double sum = s.row[0][s.behind + c] * w[0];
#pragma GCC unroll 8
      for (int i = 1; i < kRows; ++i) sum += s.row[i][s.behind + c] * w[i];
      y[s.column[c]] += sum;
    }
    for (int i = 0; i < kRows; ++i) y[first + i] = f.diag[first + i] * w[i];
  }

  template <int kRows>
  SM_PASS_INLINE static void backward(const Strip<kRows>& s, i64 first, double* y) {
    Lanes sum[kRows];
#pragma GCC unroll 8
    for (int i = 0; i < kRows; ++i) sum[i] = Lanes{};
    i64 c = 0;
    for (; c + kLanes <= s.count; c += kLanes) {
      Lanes z;
#pragma GCC unroll 8
      for (int q = 0; q < kLanes; ++q) z[q] = y[s.column[c + q]];
#pragma GCC unroll 8
      for (int i = 0; i < kRows; ++i) sum[i] += *reinterpret_cast<const Lanes*>(s.row[i] + s.behind + c) * z;
    }
    double w[kRows];
    for (int i = 0; i < kRows; ++i) {
      const Lanes& t = sum[i];
      w[i] = ((t[0] + t[4]) + (t[2] + t[6])) + ((t[1] + t[5]) + (t[3] + t[7]));
    }
    for (; c < s.count; ++c) {
      const double z = y[s.column[c]];
#pragma GCC unroll 8
      for (int i = 0; i < kRows; ++i) w[i] += s.row[i][s.behind + c] * z;
    }
#pragma GCC unroll 8
    for (int i = kRows - 1; i >= 0; --i) {
#pragma GCC unroll 8
      for (int j = i + 1; j < kRows; ++j) w[i] += s.row[i][s.inside + j] * w[j];
      y[first + i] = w[i] += y[first + i];
    }
  }
};

// Eight vectors, one to a lane.
struct Several {
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

constexpr int kMostRows = 8;

// A strip of `rows` <= kRows rows of a block.
template <class Road, int kRows = kMostRows>
SM_PASS_INLINE void forward_strip(const FactorRows& f, i64 block, i64 first, i64 rows, double* y) {
  if constexpr (kRows > 1) {
    if (rows < kRows) {
      forward_strip<Road, kRows - 1>(f, block, first, rows, y);
      return;
    }
  }
  Road::forward(f, strip_of<kRows>(f, block, first), first, y);
}

template <class Road, int kRows = kMostRows>
SM_PASS_INLINE void backward_strip(const FactorRows& f, i64 block, i64 first, i64 rows, double* y) {
  if constexpr (kRows > 1) {
    if (rows < kRows) {
      backward_strip<Road, kRows - 1>(f, block, first, rows, y);
      return;
    }
  }
  Road::backward(strip_of<kRows>(f, block, first), first, y);
}

template <class Road>
SM_PASS_TARGET void forward_pass(const FactorRows& f, double* y) {
  for (i64 block = 0; block < f.n;) {
    i64 end = block + 1;
    while (f.continues(end - 1)) ++end;
    if (end == block + 1) {
      Road::forward(f, strip_of<1>(f, block, block), block, y);
    } else {
      for (i64 k = block; k < end; k += kMostRows)
        forward_strip<Road>(f, block, k, std::min<i64>(kMostRows, end - k), y);
    }
    block = end;
  }
}

template <class Road>
SM_PASS_TARGET void backward_pass(const FactorRows& f, double* y) {
  for (i64 end = f.n; end > 0;) {
    i64 block = end - 1;
    while (block > 0 && f.continues(block - 1)) --block;
    if (end == block + 1) {
      Road::backward(strip_of<1>(f, block, block), block, y);
    } else {
      for (i64 k = end; k > block;) {
        const i64 rows = std::min<i64>(kMostRows, k - block);
        k -= rows;
        backward_strip<Road>(f, block, k, rows, y);
      }
    }
    end = block;
  }
}

constexpr SubstitutionPasses kPasses = {forward_pass<Single>, backward_pass<Single>, forward_pass<Several>,
                                        backward_pass<Several>};
