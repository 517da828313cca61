// Which tile kernels run here.
#include "cholesky/tiles.hpp"

namespace sm {

namespace {

bool cpu_has(TileSet set) {
#if defined(__x86_64__)
  __builtin_cpu_init();  // this runs among the constructors
  if (set == TileSet::avx512) return __builtin_cpu_supports("avx512f");
  if (set == TileSet::avx2) return __builtin_cpu_supports("avx2") && __builtin_cpu_supports("fma");
#endif
  return set == TileSet::portable;
}

const TileKernels* kernels_of(TileSet set) {
  switch (set) {
    case TileSet::avx512:
      return kAvx512Tiles;
    case TileSet::avx2:
      return kAvx2Tiles;
    default:
      return kPortableTiles;
  }
}

const TileKernels* chosen = nullptr;
TileSet chosen_set = TileSet::portable;

[[gnu::constructor]] void choose_tiles() {
  if (!use_tiles(TileSet::avx512) && !use_tiles(TileSet::avx2)) use_tiles(TileSet::portable);
}

}  // namespace

const TileKernels& tile_kernels() { return *chosen; }

TileSet chosen_tiles() { return chosen_set; }

bool use_tiles(TileSet set) {
  if (!cpu_has(set)) return false;
  chosen = kernels_of(set);
  chosen_set = set;
  return true;
}

}  // namespace sm
