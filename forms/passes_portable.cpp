// The passes of products with the vectors that every processor of the build has.
#include <algorithm>
#include <cstdint>

#include "cholesky/tiles.hpp"
#include "forms/passes.hpp"

#define SM_PASS_TARGET

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

const Passes kPortablePasses = kPasses;

const Passes& passes() {
  switch (chosen_tiles()) {
    case TileSet::avx512:
      return kAvx512Passes;
    case TileSet::avx2:
      return kAvx2Passes;
    default:
      return kPortablePasses;
  }
}

}  // namespace sm
