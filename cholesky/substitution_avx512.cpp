// The passes of substitution with AVX-512 vectors.
#include <algorithm>
#include <bit>
#include <cstdint>

#include "cholesky/substitution.hpp"

#if defined(__x86_64__)
#include <immintrin.h>
#define SM_PASS_TARGET __attribute__((target("avx512f")))
#else
#define SM_PASS_TARGET
#endif
#define SM_PASS_INLINE SM_PASS_TARGET __attribute__((always_inline)) inline

namespace sm {

namespace {

#if defined(__x86_64__)
struct Access {
  SM_PASS_INLINE static __mmask8 first(i64 count) { return static_cast<__mmask8>((1U << count) - 1U); }
  SM_PASS_INLINE static Lanes load(const double* p, i64 count) { return _mm512_maskz_loadu_pd(first(count), p); }
  SM_PASS_INLINE static bool equal(const i64* a, const i64* b, i64 count) {
    for (i64 c = 0; c < count; c += kLanes) {
      const __mmask8 lanes = first(std::min<i64>(kLanes, count - c));
      if (_mm512_cmpneq_epi64_mask(_mm512_maskz_loadu_epi64(lanes, a + c), _mm512_maskz_loadu_epi64(lanes, b + c))) {
        return false;
      }
    }
    return true;
  }
  SM_PASS_INLINE static __m512i ascending(i64 from) {
    return _mm512_add_epi64(_mm512_set1_epi64(from), _mm512_setr_epi64(0, 1, 2, 3, 4, 5, 6, 7));
  }
  // Lengths of the rows in `lanes` among those from k on.
  SM_PASS_INLINE static __m512i lengths(const FactorRows& f, __mmask8 lanes, i64 k) {
    return _mm512_sub_epi64(_mm512_maskz_loadu_epi64(lanes, f.iu + k + 1), _mm512_maskz_loadu_epi64(lanes, f.iu + k));
  }
  // How many of row k's columns, at most `most`, are the rows that follow it.
  SM_PASS_INLINE static int rows_below(const FactorRows& f, i64 k, i64 most) {
    const __mmask8 lanes = first(most);
    const __m512i columns = _mm512_maskz_loadu_epi64(lanes, f.columns(k));
    return std::countr_one(static_cast<unsigned>(_mm512_mask_cmpeq_epi64_mask(lanes, columns, ascending(k + 1))));
  }
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
#else
#include "cholesky/substitution_access.hpp"
using Access = PlainAccess;
#endif

#include "cholesky/substitution_body.hpp"

}  // namespace

const SubstitutionPasses kAvx512Substitution = kPasses;

}  // namespace sm
