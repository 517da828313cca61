// Blocks without any before them, and few rows behind all of them, as in the equations of subjects with some effects in
// common: part of substitution_body.hpp.
//
// A leaf needs nothing but its rows of the right-hand sides, and what is behind it. So its lanes are not kept: they are
// made from b on the way down, and again on the way up, when they become rows of x. That takes b twice, and the memory
// for lanes not at all. Where rows follow each other in the vectors, eight are turned into lanes at a time.
//
// Deliberately without an include guard.

#include "cholesky/substitution_packing.hpp"

constexpr i64 kLeafRows = 64;  // with lanes at a time: in the first-level cache
static_assert(kLeafRows >= kStripRows);
constexpr i64 kLeavesAhead = 2 * kLeafRows;  // rows of the vectors that are fetched early

// Rows of n that stand in the vectors where `there` says, to lanes and back.
template <int kWide>
struct LeafRows {
  static constexpr i64 kAll = i64{kWide} * kLanes;
  i64 n;
  const i64* there;

  // Behind the last row of the run that begins at row r: of rows that follow each other in the vectors, up or down.
  SM_PASS_INLINE i64 end_of_run(i64 r, i64 count) const {
    i64 end = r + 1;
    if (end == count) return end;
    const i64 way = there[end] - there[r];
    if (way * way != 1) return end;
    while (end < count && there[end] - there[end - 1] == way) ++end;
    return end;
  }
  SM_PASS_INLINE void take_eight(const double* b, i64 r, double* lanes) const {
    const i64 way = there[r + 1] - there[r];
    const i64 i = std::min(there[r], there[r + kLanes - 1]);
    double* to = lanes + (way > 0 ? r : r + kLanes - 1) * kAll;
    for (i64 h = 0; h < kWide; ++h) {
      Lanes t[kLanes];
      read_eight(b + i + h * kLanes * n, n, t);
#pragma GCC unroll 8
      for (i64 q = 0; q < kLanes; ++q) lanes_at(to + q * way * kAll + h * kLanes) = t[q];
    }
  }
  SM_PASS_INLINE void give_eight(const double* lanes, i64 r, double* x) const {
    const i64 way = there[r + 1] - there[r];
    const i64 i = std::min(there[r], there[r + kLanes - 1]);
    const double* from = lanes + (way > 0 ? r : r + kLanes - 1) * kAll;
    for (i64 h = 0; h < kWide; ++h) {
      Lanes t[kLanes];
#pragma GCC unroll 8
      for (i64 q = 0; q < kLanes; ++q) t[q] = lanes_at(from + q * way * kAll + h * kLanes);
      transpose(t);
#pragma GCC unroll 8
      for (i64 v = 0; v < kLanes; ++v) lanes_at(x + i + (h * kLanes + v) * n) = t[v];
    }
  }
  // Runs of eight rows or more go eight at a time, the last of them perhaps for the second time.
  SM_PASS_INLINE void take(const double* b, i64 count, double* lanes) const {
    for (i64 r = 0; r < count;) {
      const i64 end = end_of_run(r, count);
      if (end - r >= kLanes) {
        for (; r < end; r += kLanes) take_eight(b, std::min(r, end - kLanes), lanes);
      }
      for (; r < end; ++r) {
        for (i64 v = 0; v < kAll; ++v) lanes[r * kAll + v] = b[there[r] + v * n];
      }
      r = end;
    }
  }
  SM_PASS_INLINE void give(const double* lanes, i64 count, double* x) const {
    for (i64 r = 0; r < count;) {
      const i64 end = end_of_run(r, count);
      if (end - r >= kLanes) {
        for (; r < end; r += kLanes) give_eight(lanes, std::min(r, end - kLanes), x);
      }
      for (; r < end; ++r) {
        for (i64 v = 0; v < kAll; ++v) x[there[r] + v * n] = lanes[r * kAll + v];
      }
      r = end;
    }
  }
};

// A strip of leaves, its lanes at `own`; y is that of the rows behind.
template <int kWide>
struct LeafStrip {
  double* own;

  template <int kRows>
  SM_PASS_INLINE void forward(const FactorRows& f, const Strip<kRows>& s, i64 first, double* y) const {
    Lanes w[kRows][kWide];
    Several<kWide>::descend(s, own, w);
    Several<kWide>::add_to_tail(f, s, first, w, y);
  }
  template <int kRows>
  SM_PASS_INLINE void backward(const FactorRows& f, const Strip<kRows>& s, i64 first, double* y) const {
    Lanes w[kRows][kWide];
    Several<kWide>::descend(s, own, w);
    Several<kWide>::put_scaled(f.diag + first, w, own);
    Several<kWide>::ascend(f, s, first, y, own);
  }
};

// Leaves with lanes at hand, some whole strips at a time. What the next ones will need of the vectors is fetched while
// these are at work, a line of each vector at a time.
template <int kWide>
struct LeafPass {
  static constexpr i64 kAll = i64{kWide} * kLanes;
  const FactorRows& f;
  const i64* perm;
  i64 leaves;
  double lanes[kLeafRows * kAll];

  template <int kWrite>
  SM_PASS_INLINE void fetch(const double* vectors, i64 row) const {
    const double* at = vectors + perm[row];
#pragma GCC unroll 16
    for (i64 v = 0; v < kAll; ++v) __builtin_prefetch(at + v * f.n, kWrite);
  }
  // As many whole strips as are in rows begin .. begin + kLeafRows - 1; answers where they end.
  SM_PASS_INLINE i64 forward(i64 begin, const double* b, double* y) {
    const i64 end = std::min(begin + kLeafRows, leaves);
    LeafRows<kWide>{f.n, perm + begin}.take(b, end - begin, lanes);
    i64 fetched = begin + kLeavesAhead;
    for (i64 k = begin;;) {
      const i64 rows = f.rows_from(k);
      if (k + rows > end) return k;
      LeafStrip<kWide> road{lanes + (k - begin) * kAll};
      k += forward_strip(road, f, k, rows, y);
      for (; fetched < std::min(k + kLeavesAhead, leaves); fetched += kLanes) fetch<0>(b, fetched);
      if (k == end) return k;
    }
  }
  // The same in rows end - kLeafRows .. end - 1; answers where they begin.
  SM_PASS_INLINE i64 backward(i64 end, const double* b, double* y, double* x) {
    const i64 begin = std::max(end - kLeafRows, i64{0});
    LeafRows<kWide>{f.n, perm + begin}.take(b, end - begin, lanes);
    i64 fetched = end - kLeavesAhead;
    i64 k = end;
    while (k > begin) {
      const i64 rows = f.rows_to(k);
      if (k - rows < begin) break;
      LeafStrip<kWide> road{lanes + (k - rows - begin) * kAll};
      k -= backward_strip(road, f, k, rows, y);
      for (; fetched >= std::max(k - kLeavesAhead, i64{0}); fetched -= kLanes) {
        fetch<0>(b, fetched);
        fetch<1>(x, fetched);
      }
    }
    LeafRows<kWide>{f.n, perm + k}.give(lanes + (k - begin) * kAll, end - k, x);
    return k;
  }
};

// All groups of vectors pass through the same rows before the next rows come: these are read once for all of them.
template <int kWide>
SM_PASS_TARGET void solve_leaves(const FactorRows& given, const RowOrder& order, const LeafBatch& batch) {
  constexpr i64 kAll = i64{kWide} * kLanes;
  const FactorRows f = given;
  const i64 n = f.n;
  const i64 others = n - batch.leaves;
  const i64 first_y = -batch.leaves * kAll;  // where the lanes of row 0 would be
  const LeafRows<kWide> behind{n, order.perm + batch.leaves};
  LeafPass<kWide> pass{f, order.perm, batch.leaves, {}};
  const auto rest_of = [&](i64 g) { return batch.rest + g * others * kAll; };
  for (i64 g = 0; g < batch.groups; ++g) behind.take(batch.b + g * kAll * n, others, rest_of(g));
  for (i64 k = 0, next = 0; k < batch.leaves; k = next) {
    for (i64 g = 0; g < batch.groups; ++g) next = pass.forward(k, batch.b + g * kAll * n, rest_of(g) + first_y);
  }
  for (i64 g = 0; g < batch.groups; ++g) {
    forward_pass<Several<kWide>>(f, rest_of(g) + first_y, batch.leaves);
    backward_pass<Several<kWide>>(f, rest_of(g) + first_y, batch.leaves);
  }
  for (i64 k = batch.leaves, next = 0; k > 0; k = next) {
    for (i64 g = 0; g < batch.groups; ++g) {
      next = pass.backward(k, batch.b + g * kAll * n, rest_of(g) + first_y, batch.x + g * kAll * n);
    }
  }
  for (i64 g = 0; g < batch.groups; ++g) behind.give(rest_of(g), others, batch.x + g * kAll * n);
}
