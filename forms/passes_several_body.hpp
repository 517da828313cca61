// The pass of passes.hpp for several vectors, and the table of all passes. Included behind passes_rows_body.hpp, in
// the same namespace.
//
// Deliberately without an include guard.

// Several vectors side by side: element k of vector v in lane v of row k of a window.
constexpr int kLanes = kProductLanes;
constexpr i64 kWindow = kProductReach;  // with those of the result 256 kB of stack, which the second cache holds

typedef double Lanes __attribute__((vector_size(kLanes * sizeof(double)), aligned(sizeof(double)), may_alias));

// Rows become columns.
SM_PASS_INLINE void transpose(Lanes (&r)[kLanes]) {
  Lanes s[kLanes], t[kLanes];
#pragma GCC unroll 4
  for (int k = 0; k < kLanes; k += 2) {
    s[k] = __builtin_shufflevector(r[k], r[k + 1], 0, 8, 2, 10, 4, 12, 6, 14);
    s[k + 1] = __builtin_shufflevector(r[k], r[k + 1], 1, 9, 3, 11, 5, 13, 7, 15);
  }
#pragma GCC unroll 4
  for (int k = 0; k < kLanes; k += 4) {
#pragma GCC unroll 2
    for (int i = 0; i < 2; ++i) {
      t[k + i] = __builtin_shufflevector(s[k + i], s[k + i + 2], 0, 1, 8, 9, 4, 5, 12, 13);
      t[k + i + 2] = __builtin_shufflevector(s[k + i], s[k + i + 2], 2, 3, 10, 11, 6, 7, 14, 15);
    }
  }
#pragma GCC unroll 4
  for (int k = 0; k < 4; ++k) {
    r[k] = __builtin_shufflevector(t[k], t[k + 4], 0, 1, 2, 3, 8, 9, 10, 11);
    r[k + 4] = __builtin_shufflevector(t[k], t[k + 4], 4, 5, 6, 7, 12, 13, 14, 15);
  }
}

// The vectors of a block in memory, one after the other. A lane that has no vector of its own reads the last one and
// writes nothing.
template <class T>
struct Columns {
  T* lane[kLanes];
  int count;

  SM_PASS_INLINE Columns(T* first, i64 n, int vectors) : count(vectors) {
    for (int v = 0; v < kLanes; ++v) lane[v] = first + std::min(v, vectors - 1) * n;
  }
  SM_PASS_INLINE void gather(i64 k, Lanes& to) const {
    to = Lanes{lane[0][k], lane[1][k], lane[2][k], lane[3][k], lane[4][k], lane[5][k], lane[6][k], lane[7][k]};
  }
  SM_PASS_INLINE void add(i64 k, const Lanes& term) const {
    for (int v = 0; v < count; ++v) lane[v][k] += term[v];
  }
  SM_PASS_INLINE void clear(i64 from, i64 to) const {
    for (int v = 0; v < count; ++v) {
      for (i64 k = from; k < to; ++k) lane[v][k] = 0.0;
    }
  }
};

// The rows of both vectors that lie ahead of the row at work, side by side in a ring.
struct Window {
  Lanes x[kWindow];
  Lanes y[kWindow];
};

class SeveralPass {
 public:
  SM_PASS_INLINE SeveralPass(const UpperRows& a, const double* x, double* y, int count, bool accumulate, Window& window)
      : a_(a), x_(x, a.rows, count), y_(y, a.rows, count), window_(window), cleared_(accumulate ? a.rows : 0) {}

  SM_PASS_INLINE void run() {
    const i64 n = a_.rows;
    for (i64 i = 0; i < n; i += kLanes) {
      const i64 end = std::min(n, i + kWindow);
      for (; loaded_ < end; loaded_ += kLanes) load(std::min<i64>(kLanes, n - loaded_));
      const i64 last = std::min(n, i + kLanes);
      for (i64 k = i; k < last; ++k) row(k);
      store(i, last - i);
    }
  }

 private:
  SM_PASS_INLINE static i64 slot(i64 k) { return k & (kWindow - 1); }

  SM_PASS_INLINE void load(i64 rows) {
    const i64 at = slot(loaded_);
    Lanes t[kLanes] = {};
    read(x_, loaded_, rows, t);
    for (int k = 0; k < kLanes; ++k) window_.x[at + k] = t[k];
    if (cleared_ <= loaded_) {
      for (int k = 0; k < kLanes; ++k) window_.y[at + k] = Lanes{};
      return;
    }
    if (cleared_ < loaded_ + rows) {
      y_.clear(cleared_, loaded_ + rows);
      cleared_ = loaded_ + rows;
    }
    read(y_, loaded_, rows, t);
    for (int k = 0; k < kLanes; ++k) window_.y[at + k] = t[k];
  }
  template <class T>
  SM_PASS_INLINE static void read(const Columns<T>& from, i64 k, i64 rows, Lanes (&t)[kLanes]) {
    if (rows == kLanes) {
      for (int v = 0; v < kLanes; ++v) t[v] = *reinterpret_cast<const Lanes*>(from.lane[v] + k);
      transpose(t);
    } else {
      for (i64 i = 0; i < rows; ++i) from.gather(k + i, t[i]);
    }
  }
  SM_PASS_INLINE void store(i64 k, i64 rows) {
    Lanes t[kLanes];
    for (int i = 0; i < kLanes; ++i) t[i] = window_.y[slot(k) + i];
    if (rows == kLanes) {
      transpose(t);
      for (int v = 0; v < y_.count; ++v) *reinterpret_cast<Lanes*>(y_.lane[v] + k) = t[v];
    } else {
      for (i64 i = 0; i < rows; ++i) {
        for (int v = 0; v < y_.count; ++v) y_.lane[v][k + i] = t[i][v];
      }
    }
  }

  SM_PASS_INLINE void row(i64 i) {
    const i64* const column = a_.col_index;
    const double* const value = a_.values;
    const i64 loaded = loaded_;
    i64 p = a_.row_start[i];
    const i64 end = a_.row_start[i + 1];
    fetch_entries(a_, p);
    const Lanes t = window_.x[slot(i)];
    Lanes diagonal{};
    if (p < end && column[p] == i) diagonal = value[p++] * t;
    Lanes sum{};
    for (; p < end; ++p) {
      const i64 k = column[p];
      if (k >= loaded) break;
      const double v = value[p];
      sum += v * window_.x[slot(k)];
      window_.y[slot(k)] += v * t;
    }
    if (p < end) far(p, end, t, sum);
    window_.y[slot(i)] += diagonal + sum;
  }
  // Entries p to `end`, whose columns lie behind the window.
  SM_PASS_INLINE void far(i64 p, i64 end, const Lanes& t, Lanes& sum) {
    if (const i64 last = a_.col_index[end - 1]; last >= cleared_) {
      const i64 from = std::max(cleared_, loaded_);
      cleared_ = std::min(a_.rows, last + kAhead);
      y_.clear(from, cleared_);
    }
    for (; p < end; ++p) {
      const i64 k = a_.col_index[p];
      const double v = a_.values[p];
      Lanes xk;
      x_.gather(k, xk);
      sum += v * xk;
      y_.add(k, v * t);
    }
  }

  const UpperRows& a_;
  Columns<const double> x_;
  Columns<double> y_;
  Window& window_;
  i64 loaded_ = 0;  // rows before it have been in the window
  i64 cleared_;     // elements of y before it hold sums already; those behind are not cleared yet
};

SM_PASS_TARGET void multiply_several(const UpperRows& a, const double* x, double* y, int count, bool accumulate) {
  Window window;
  SeveralPass(a, x, y, count, accumulate, window).run();
}

constexpr Passes kPasses = {multiply_one, multiply_several, list_rows, direct, advance, measure};
