// The passes of substitution with AVX-512 vectors.
#include <algorithm>

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
  SM_PASS_INLINE static Lanes gather(const double* y, const i64* column, i64 count) {
    const __m512i place = _mm512_maskz_loadu_epi64(first(count), column);
    return _mm512_mask_i64gather_pd(_mm512_setzero_pd(), first(count), place, y, sizeof(double));
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
