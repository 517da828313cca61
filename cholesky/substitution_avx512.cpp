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
  static constexpr int kWide = 2;  // of eight rows, sixteen vectors fill half of the registers
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
};
#else
#include "cholesky/substitution_access.hpp"
using Access = PlainAccess;
#endif

#include "cholesky/substitution_body.hpp"

}  // namespace

const SubstitutionPasses kAvx512Substitution = kPasses;

}  // namespace sm
