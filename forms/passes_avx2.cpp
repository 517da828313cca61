// The passes of products with AVX2 vectors.
#include <algorithm>

#include "forms/passes.hpp"

#if defined(__x86_64__)
#define SM_PASS_TARGET __attribute__((target("avx2")))
#else
#define SM_PASS_TARGET
#endif

namespace sm {

namespace {

#include "forms/passes_body.hpp"
#include "forms/passes_several_body.hpp"

}  // namespace

const Passes kAvx2Passes = kPasses;

}  // namespace sm
