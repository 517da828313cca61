// Tile kernels for AVX-512: strips of 8 rows, tiles of 24 columns, 24 of the 32 registers for the sums.
#include "cholesky/blocks.hpp"
#include "cholesky/tiles.hpp"

#if defined(__x86_64__)

#include <immintrin.h>

#define SM_TILE_TARGET __attribute__((target("avx512f")))
#define SM_TILE_INLINE SM_TILE_TARGET __attribute__((always_inline)) inline

namespace sm {

namespace {

struct X {
  using Vector = __m512d;
  static constexpr i64 kWidth = 8;
  static constexpr int kRows = 8;
  static constexpr int kVectors = 3;

  SM_TILE_INLINE static __mmask8 mask(int n) { return static_cast<__mmask8>((1U << n) - 1U); }
  SM_TILE_INLINE static Vector zero() { return _mm512_setzero_pd(); }
  SM_TILE_INLINE static Vector all(double x) { return _mm512_set1_pd(x); }
  SM_TILE_INLINE static Vector load(const double* p) { return _mm512_loadu_pd(p); }
  SM_TILE_INLINE static Vector load(const double* p, int n) { return _mm512_maskz_loadu_pd(mask(n), p); }
  SM_TILE_INLINE static void store(double* p, Vector v) { _mm512_storeu_pd(p, v); }
  SM_TILE_INLINE static void store(double* p, Vector v, int n) { _mm512_mask_storeu_pd(p, mask(n), v); }
  SM_TILE_INLINE static Vector add(Vector a, Vector b) { return _mm512_add_pd(a, b); }
  SM_TILE_INLINE static Vector fma(Vector a, Vector b, Vector c) { return _mm512_fmadd_pd(a, b, c); }
};

#include "cholesky/tiles_body.hpp"
//
#include "cholesky/small_body.hpp"
//
#include "cholesky/small_inverse_body.hpp"

const TileKernels kKernels = {"AVX-512",  X::kRows,    X::kVectors* X::kWidth, strip, pack, spread, factor_small,
                              add_square, invert_small};

}  // namespace

const TileKernels* const kAvx512Tiles = &kKernels;

}  // namespace sm

#else

const sm::TileKernels* const sm::kAvx512Tiles = nullptr;

#endif
