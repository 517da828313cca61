// Linked into a suite, runs all of it with one set of tile kernels; with the portable ones where the CPU lacks that
// set.
#include <gtest/gtest.h>

#include <cstdio>

#include "cholesky/tiles.hpp"

namespace sm::test {
namespace {

class ForcedTiles : public ::testing::Environment {
 public:
  void SetUp() override {
    if (!use_tiles(TileSet::FORCED_TILES)) use_tiles(TileSet::portable);
    std::printf("tile kernels: %s\n", tile_kernels().name);
  }
};

const ::testing::Environment* const kForced = ::testing::AddGlobalTestEnvironment(new ForcedTiles);

}  // namespace
}  // namespace sm::test
