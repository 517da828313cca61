// Tile kernels for AVX2 with FMA: strips of 4 rows, tiles of 12 columns, 12 of the 16 registers for the sums.
#include <algorithm>

#include "cholesky/blocks.hpp"
#include "cholesky/tiles.hpp"

#if defined(__x86_64__)

#include <immintrin.h>

#define SM_TILE_TARGET __attribute__((target("avx2,fma")))
#define SM_TILE_INLINE SM_TILE_TARGET __attribute__((always_inline)) inline

namespace sm {

namespace {

struct X {
  using Vector = __m256d;
  static constexpr i64 kWidth = 4;
  static constexpr int kRows = 4;
  static constexpr int kVectors = 3;

  SM_TILE_INLINE static __m256i mask(int n) {
    return _mm256_cmpgt_epi64(_mm256_set1_epi64x(n), _mm256_setr_epi64x(0, 1, 2, 3));
  }
  SM_TILE_INLINE static Vector zero() { return _mm256_setzero_pd(); }
  SM_TILE_INLINE static Vector all(double x) { return _mm256_set1_pd(x); }
  SM_TILE_INLINE static Vector load(const double* p) { return _mm256_loadu_pd(p); }
  SM_TILE_INLINE static Vector load(const double* p, int n) { return _mm256_maskload_pd(p, mask(n)); }
  SM_TILE_INLINE static void store(double* p, Vector v) { _mm256_storeu_pd(p, v); }
  SM_TILE_INLINE static void store(double* p, Vector v, int n) { _mm256_maskstore_pd(p, mask(n), v); }
  SM_TILE_INLINE static void turn(Vector (&t)[kWidth]) {
    const Vector a = _mm256_unpacklo_pd(t[0], t[1]), b = _mm256_unpackhi_pd(t[0], t[1]);
    const Vector c = _mm256_unpacklo_pd(t[2], t[3]), d = _mm256_unpackhi_pd(t[2], t[3]);
    t[0] = _mm256_permute2f128_pd(a, c, 0x20);
    t[1] = _mm256_permute2f128_pd(b, d, 0x20);
    t[2] = _mm256_permute2f128_pd(a, c, 0x31);
    t[3] = _mm256_permute2f128_pd(b, d, 0x31);
  }
  SM_TILE_INLINE static Vector add(Vector a, Vector b) { return _mm256_add_pd(a, b); }
  SM_TILE_INLINE static Vector fma(Vector a, Vector b, Vector c) { return _mm256_fmadd_pd(a, b, c); }
};

#include "cholesky/tiles_body.hpp"
//
#include "cholesky/small_body.hpp"
//
#include "cholesky/small_inverse_body.hpp"

const TileKernels kKernels = {"AVX2",        X::kRows,    X::kVectors* X::kWidth, strip,  pack,
                              multiply_rows, turn,        expand_plain,           spread, factor_small,
                              add_square,    invert_small};

}  // namespace

const TileKernels* const kAvx2Tiles = &kKernels;

}  // namespace sm

#else

const sm::TileKernels* const sm::kAvx2Tiles = nullptr;

#endif
