// Eight elements at once, where a CPU has no instruction of its own for it.
//
// Deliberately without an include guard, as substitution_body.hpp.

struct PlainAccess {
  static constexpr int kWide = 1;  // more vectors than eight do not fit the registers
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
};
