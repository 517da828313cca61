// Eight elements at once, where a CPU has no instruction of its own for it.
//
// Deliberately without an include guard, as substitution_body.hpp.

struct PlainAccess {
  // The first `count` of eight elements, 1 <= count <= 8, then zeros.
  SM_PASS_INLINE static Lanes load(const double* p, i64 count) {
    if (count == kLanes) return *reinterpret_cast<const Lanes*>(p);
    Lanes v{};
#pragma GCC unroll 8
    for (int q = 0; q < kLanes; ++q) v[q] = q < count ? p[q] : 0.0;
    return v;
  }
  SM_PASS_INLINE static bool equal(const i64* a, const i64* b, i64 count) {
    i64 c = 0;
    while (c < count && a[c] == b[c]) ++c;
    return c == count;
  }
  // How many rows from k on, at most kStripRows, have one structure.
  SM_PASS_INLINE static i64 rows_from(const FactorRows& f, i64 k) {
    const i64 most = std::min<i64>(kStripRows, f.n - k);
    i64 rows = 1;
    while (rows < most && f.continues(k + rows - 1)) ++rows;
    return rows;
  }
  // The same of the rows before `end`.
  SM_PASS_INLINE static i64 rows_to(const FactorRows& f, i64 end) {
    const i64 most = std::min<i64>(kStripRows, end);
    i64 rows = 1;
    while (rows < most && f.continues(end - rows - 1)) ++rows;
    return rows;
  }
};
