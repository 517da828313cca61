// The passes of substitution with AVX2 vectors.
#include <algorithm>

#include "cholesky/substitution.hpp"

#if defined(__x86_64__)
#define SM_PASS_TARGET __attribute__((target("avx2")))
#else
#define SM_PASS_TARGET
#endif

namespace sm {

namespace {

#include "cholesky/substitution_body.hpp"

}  // namespace

const SubstitutionPasses kAvx2Substitution = kPasses;

}  // namespace sm
