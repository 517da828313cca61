// The passes of products with AVX-512 vectors.
#include <algorithm>
#include <cstdint>

#include "forms/passes.hpp"

#if defined(__x86_64__)
#define SM_PASS_TARGET __attribute__((target("avx512f")))
#else
#define SM_PASS_TARGET
#endif

namespace sm {

namespace {

// Each needs those before it.
// clang-format off
#include "forms/passes_body.hpp"
#include "forms/passes_strips_body.hpp"
#include "forms/passes_pieces_body.hpp"
#include "forms/passes_rows_body.hpp"
#include "forms/passes_several_body.hpp"
// clang-format on

}  // namespace

const Passes kAvx512Passes = kPasses;

}  // namespace sm
