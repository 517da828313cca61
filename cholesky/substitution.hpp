// Passes over a finished sparse factor: U'D forward and U backward, for one vector, or for eight or sixteen side by
// side.
//
// Both walk strips of up to eight rows with one structure (cholesky/blocks.hpp): a column behind the strip is then
// fetched, and stored, once for all of its rows. The passes are compiled for the widest vectors of a few
// processors. They multiply and add without fusing, lane by lane: the bits are the same on all of them.
#pragma once

#include <algorithm>

#include "frame/core.hpp"

#if defined(__GNUC__)
#pragma GCC diagnostic ignored "-Wpsabi"  // all that returns vectors is inlined
#endif

namespace sm {

inline constexpr int kLanes = 8;
inline constexpr int kStripRows = 8;
typedef double Lanes __attribute__((vector_size(kLanes * sizeof(double)), aligned(sizeof(double)), may_alias));

struct FactorRows {
  explicit FactorRows(const SmMatrix& m)
      : n(m.rows),
        iju(m.factor_iju),
        iu(m.factor_iu),
        ju(m.factor_ju),
        values(m.factor_values),
        diag(m.factor_diag),
        far(iu[n] > kNear) {}

  i64 length(i64 k) const { return iu[k + 1] - iu[k]; }
  const i64* columns(i64 k) const { return ju + iju[k]; }
  // Rows k and k + 1 have the same structure but for column k + 1.
  bool continues(i64 k) const { return length(k) > 0 && length(k + 1) == length(k) - 1 && columns(k)[0] == k + 1; }
  // How many rows from k on, at most kStripRows, have one structure; and how many before `end`. Row by row: a strip's
  // end must be guessed by the CPU, not waited for.
  i64 rows_from(i64 k) const {
    const i64 most = std::min<i64>(kStripRows, n - k);
    i64 rows = 1;
    while (rows < most && continues(k + rows - 1)) ++rows;
    return rows;
  }
  i64 rows_to(i64 end) const {
    const i64 most = std::min<i64>(kStripRows, end);
    i64 rows = 1;
    while (rows < most && continues(end - rows - 1)) ++rows;
    return rows;
  }

  i64 n;
  const i64 *iju, *iu, *ju;
  const double *values, *diag;
  bool far;  // too much to stay in a cache between solves

 private:
  static constexpr i64 kNear = i64{1} << 20;
};

// Where rows go: row i of the vectors is row place[i] of the factor, and perm[place[i]] is i.
struct RowOrder {
  i64 n;
  const i64 *perm, *place;
};

// `groups` times as many vectors as there are lanes, to be solved for where the first `leaves` rows are leaves: blocks
// to which no row before them adds anything, and behind all of which are their tails. `rest` is room for the lanes of
// the other rows.
struct LeafBatch {
  i64 leaves, groups;
  const double* b;
  double *x, *rest;
};

// For `lanes` vectors side by side: element k of vector v is y[k * lanes + v], in the order of the factor.
struct LanePasses {
  int lanes;
  void (*pack)(const RowOrder& order, const double* b, double* y);
  // The rows from `first` on, where a block begins.
  void (*forward)(const FactorRows& f, double* y, i64 first);
  void (*backward)(const FactorRows& f, double* y, i64 first);
  void (*unpack)(const RowOrder& order, const double* y, double* x);
  // From y to y; `spare` has room for n elements.
  void (*unpack_in_place)(const RowOrder& order, double* y, double* spare);
  void (*solve_leaves)(const FactorRows& f, const RowOrder& order, const LeafBatch& batch);
};

struct SubstitutionPasses {
  void (*forward)(const FactorRows& f, double* y, i64 first);
  void (*backward)(const FactorRows& f, double* y, i64 first);
  LanePasses wide, eight;  // wide may be eight, too
};

extern const SubstitutionPasses kPortableSubstitution;
extern const SubstitutionPasses kAvx2Substitution;
extern const SubstitutionPasses kAvx512Substitution;

const SubstitutionPasses& substitution_passes();

}  // namespace sm
