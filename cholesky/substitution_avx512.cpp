// The passes of substitution with AVX-512 vectors.
#include <algorithm>

#include "cholesky/substitution.hpp"

#if defined(__x86_64__)
#define SM_PASS_TARGET __attribute__((target("avx512f")))
#else
#define SM_PASS_TARGET
#endif

namespace sm {

namespace {

#include "cholesky/substitution_body.hpp"

}  // namespace

const SubstitutionPasses kAvx512Substitution = kPasses;

}  // namespace sm
