// The passes of substitution with AVX2 vectors.
#include <algorithm>

#include "cholesky/substitution.hpp"

#if defined(__x86_64__)
#include <immintrin.h>
#define SM_PASS_TARGET __attribute__((target("avx2")))
#else
#define SM_PASS_TARGET
#endif
#define SM_PASS_INLINE SM_PASS_TARGET __attribute__((always_inline)) inline

namespace sm {

namespace {

#include "cholesky/substitution_access.hpp"

using Access = PlainAccess;

#include "cholesky/substitution_body.hpp"

}  // namespace

const SubstitutionPasses kAvx2Substitution = kPasses;

}  // namespace sm
