// One vector: part of substitution_body.hpp.
//
// Deliberately without an include guard.

// Sums over the lanes of kRows vectors, each as ((0 + 4) + (2 + 6)) + ((1 + 5) + (3 + 7)), eight vectors at a time.
template <int kRows>
SM_PASS_INLINE Lanes sums_of(const Lanes (&v)[kRows]) {
  Lanes quarter[4];
  Lanes half[2];
#pragma GCC unroll 4
  for (int i = 0; i < 4; ++i) {
    const int pair = 2 * i;
    const Lanes& a = v[std::min(pair, kRows - 1)];
    const Lanes& b = v[std::min(pair + 1, kRows - 1)];
    quarter[i] = __builtin_shufflevector(a, b, 0, 1, 2, 3, 8, 9, 10, 11) +
                 __builtin_shufflevector(a, b, 4, 5, 6, 7, 12, 13, 14, 15);
  }
#pragma GCC unroll 2
  for (int i = 0; i < 2; ++i) {
    const int pair = 2 * i;
    const Lanes& a = quarter[pair];
    const Lanes& b = quarter[pair + 1];
    half[i] = __builtin_shufflevector(a, b, 0, 1, 4, 5, 8, 9, 12, 13) +
              __builtin_shufflevector(a, b, 2, 3, 6, 7, 10, 11, 14, 15);
  }
  return __builtin_shufflevector(half[0], half[1], 0, 2, 4, 6, 8, 10, 12, 14) +
         __builtin_shufflevector(half[0], half[1], 1, 3, 5, 7, 9, 11, 13, 15);
}

// The tail of the last narrow block, up to kNarrowTail columns. Blocks that follow each other often share theirs: what
// subjects add to the columns that border all of them is then summed here, and added to y once.
class SharedTail {
 public:
  SM_PASS_INLINE bool is(const i64* column, i64 count) const {
    return count == count_ && Access::equal(column, column_, count);
  }
  SM_PASS_INLINE void become(const i64* column, i64 count) {
    column_ = column;
    count_ = count;
  }
  // A first block with this tail has added to y itself.
  SM_PASS_INLINE void add(i64 place, const Lanes& sum) {
    lanes_[place / kLanes] = waiting_ ? lanes_[place / kLanes] + sum : sum;
  }
  // Until it is flushed: its columns are rows to come, the first of which has another tail.
  SM_PASS_INLINE void wait() { waiting_ = true; }
  SM_PASS_INLINE void flush(double* y) {
    if (!waiting_) return;
    for (i64 c = 0; c < count_; ++c) y[column_[c]] += lanes_[c / kLanes][c % kLanes];
    waiting_ = false;
  }
  SM_PASS_INLINE void gather(const double* y) {
    auto* to = reinterpret_cast<double*>(lanes_);
    for (i64 c = 0; c < count_; ++c) to[c] = y[column_[c]];
    for (i64 c = count_; c % kLanes; ++c) to[c] = 0.0;
  }
  SM_PASS_INLINE const Lanes& at(i64 place) const { return lanes_[place / kLanes]; }

 private:
  const i64* column_ = nullptr;
  i64 count_ = 0;
  bool waiting_ = false;
  Lanes lanes_[kNarrowTail / kLanes];
};

struct Single {
  SharedTail tail;

  template <int kRows>
  SM_PASS_INLINE static void forward_triangle(const Strip<kRows>& s, const double* y, double (&w)[kRows]) {
#pragma GCC unroll 8
    for (int i = 0; i < kRows; ++i) w[i] = y[i];
#pragma GCC unroll 8
    for (int i = 0; i < kRows; ++i) {
#pragma GCC unroll 8
      for (int j = i + 1; j < kRows; ++j) w[j] += s.at(i)[j] * w[i];
    }
  }

  // The row below comes last into each sum: it is what the sum waits for.
  template <int kRows>
  SM_PASS_INLINE static void backward_triangle(const Strip<kRows>& s, const Lanes& sums, double* y) {
    double w[kRows];
#pragma GCC unroll 8
    for (int i = kRows - 1; i >= 0; --i) {
      double sum = sums[i] + y[i];
#pragma GCC unroll 8
      for (int j = kRows - 1; j > i; --j) sum += s.at(i)[j] * w[j];
      y[i] = w[i] = sum;
    }
  }

  // A strip with at most kNarrowTail columns behind it.
  template <int kRows>
  SM_PASS_INLINE void forward_narrow(const FactorRows& f, const Strip<kRows>& s, i64 first, double* y) {
    fetch_narrow(f, s, first, 1);
    const bool shared = tail.is(s.column, s.count);
    if (!shared) {
      tail.flush(y);  // before y is read: these rows may be in that tail
      tail.become(s.column, s.count);
    }
    double w[kRows];
    forward_triangle(s, y + first, w);
    for (i64 c = 0; c < s.count; c += kLanes) {
      const i64 lanes = std::min<i64>(kLanes, s.count - c);
      Lanes sum = Access::load(s.at(0) + kRows + c, lanes) * w[0];
#pragma GCC unroll 8
      for (int i = 1; i < kRows; ++i) sum += Access::load(s.at(i) + kRows + c, lanes) * w[i];
      if (shared) {
        tail.add(c, sum);
      } else {
        for (i64 q = 0; q < lanes; ++q) y[s.column[c + q]] += sum[q];
      }
    }
    if (shared) tail.wait();
    for (int i = 0; i < kRows; ++i) y[first + i] = f.diag[first + i] * w[i];
  }

  template <int kRows>
  SM_PASS_INLINE void backward_narrow(const FactorRows& f, const Strip<kRows>& s, i64 first, double* y) {
    fetch_narrow(f, s, first, -1);
    if (!tail.is(s.column, s.count)) {
      tail.become(s.column, s.count);
      tail.gather(y);
    }
    Lanes sum[kRows];
#pragma GCC unroll 8
    for (int i = 0; i < kRows; ++i) sum[i] = Lanes{};
    for (i64 c = 0; c < s.count; c += kLanes) {
      const i64 lanes = std::min<i64>(kLanes, s.count - c);
      const Lanes z = tail.at(c);
#pragma GCC unroll 8
      for (int i = 0; i < kRows; ++i) sum[i] += Access::load(s.at(i) + kRows + c, lanes) * z;
    }
    backward_triangle(s, sums_of(sum), y + first);
  }

  template <int kRows>
  SM_PASS_INLINE void forward(const FactorRows& f, const Strip<kRows>& s, i64 first, double* y) {
    if constexpr (kRows > 1) {
      if (s.count <= kNarrowTail) {
        forward_narrow(f, s, first, y);
        return;
      }
    }
    tail.flush(y);
    if constexpr (kRows == 1) {
      fetch_single(s, 1);
    }
    double w[kRows];
    forward_triangle(s, y + first, w);
    const bool far = f.far;
    const double* row[kRows];
#pragma GCC unroll 8
    for (int i = 0; i < kRows; ++i) row[i] = s.at(i) + kRows;
    i64 c = 0;
    if constexpr (kRows > 1) {
      for (; c + kLanes <= s.count; c += kLanes) {
        Lanes sum = *reinterpret_cast<const Lanes*>(row[0] + c) * w[0];
#pragma GCC unroll 8
        for (int i = 1; i < kRows; ++i) sum += *reinterpret_cast<const Lanes*>(row[i] + c) * w[i];
        if (far) fetch_rows(row, c);
#pragma GCC unroll 8
        for (int q = 0; q < kLanes; ++q) y[s.column[c + q]] += sum[q];
      }
    }
    for (; c < s.count; ++c) {
      double sum = row[0][c] * w[0];
#pragma GCC unroll 8
      for (int i = 1; i < kRows; ++i) sum += row[i][c] * w[i];
      y[s.column[c]] += sum;
    }
    for (int i = 0; i < kRows; ++i) y[first + i] = f.diag[first + i] * w[i];
  }

  template <int kRows>
  SM_PASS_INLINE void backward(const FactorRows& f, const Strip<kRows>& s, i64 first, double* y) {
    if constexpr (kRows > 1) {
      if (s.count <= kNarrowTail) {
        backward_narrow(f, s, first, y);
        return;
      }
    } else {
      fetch_single(s, -1);
    }
    Lanes sum[kRows];
#pragma GCC unroll 8
    for (int i = 0; i < kRows; ++i) sum[i] = Lanes{};
    const bool far = f.far;
    const double* row[kRows];
#pragma GCC unroll 8
    for (int i = 0; i < kRows; ++i) row[i] = s.at(i) + kRows;
    i64 c = 0;
    for (; c + kLanes <= s.count; c += kLanes) {
      if (far) fetch_rows(row, c);
      Lanes z;
#pragma GCC unroll 8
      for (int q = 0; q < kLanes; ++q) z[q] = y[s.column[c + q]];
#pragma GCC unroll 8
      for (int i = 0; i < kRows; ++i) sum[i] += *reinterpret_cast<const Lanes*>(row[i] + c) * z;
    }
    Lanes sums = sums_of(sum);
    for (; c < s.count; ++c) {
      const double z = y[s.column[c]];
#pragma GCC unroll 8
      for (int i = 0; i < kRows; ++i) sums[i] += row[i][c] * z;
    }
    backward_triangle(s, sums, y + first);
  }
};
