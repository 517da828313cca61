// Products with the compressed rows of a symmetric matrix, and the sweeps over vectors between them.
//
// A row adds to the result at its own place and at those of its columns, so the memory that a product touches is the
// matrix once and the vectors. Rows reach ahead, never back: what a row needs of the vectors is made ready in pieces
// just before it (cleared, or computed), while the caches hold it.
//
// The passes are compiled for the widest vectors of a few processors. They multiply and add without fusing, in lanes
// that are ours: the bits are the same on all of them.
#pragma once

#include "store/views.hpp"

namespace sm {

inline constexpr int kProductLanes = 8;     // vectors that go through the matrix together
inline constexpr i64 kProductReach = 2048;  // rows ahead of the one at work that they have side by side

// Words of a list of rows, at most: a strip has 8 rows at least, and a batch 32, at most two pieces of 4 bytes each.
inline i64 list_words(i64 n) { return n + n / 2 + 3; }

// The diagonal preconditioner, the residual, and what they make the next direction from.
struct Direction {
  const double* inverse;
  const double* r;
  double beta;
  double* p;
  double* q;
};

// Where a step leads: x and r along p and q.
struct Step {
  i64 n;
  double alpha;
  const double* p;
  const double* q;
  const double* inverse;
  double* x;
  double* r;
};

struct Passes {
  // y <- A x, or y += A x when it accumulates.
  void (*multiply)(const UpperRows& a, const double* x, double* y, bool accumulate);
  // The same for count <= kProductLanes vectors, n elements each; for rows that ascend.
  void (*multiply_several)(const UpperRows& a, const double* x, double* y, int count, bool accumulate);
  // How the rows are taken by `direct`, which the pattern tells: list_words(n) words. The first tells whether there are
  // batches. Of each turn first a word: so many rows that continue each other; negative, so many others; 0, a batch of
  // rows cut into pieces, and what that is.
  void (*list_rows)(const UpperRows& a, i64* list);
  // p <- inverse r + beta p, element by element, and q <- A p. Answers p'q.
  double (*direct)(const UpperRows& a, const i64* list, const Direction& d);
  // x += alpha p and r -= alpha q. Answers r' inverse r.
  double (*advance)(const Step& s);
  // r <- b - q. Answers r' inverse r.
  double (*measure)(i64 n, const double* b, const double* q, const double* inverse, double* r);
};

extern const Passes kPortablePasses;
extern const Passes kAvx2Passes;
extern const Passes kAvx512Passes;

const Passes& passes();

}  // namespace sm
