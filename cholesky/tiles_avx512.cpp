// Tile kernels for AVX-512: strips of 8 rows, tiles of 24 columns, 24 of the 32 registers for the sums.
#include <algorithm>
#include <bit>

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
  // Pairs of elements, then of pairs, then halves. GCC 12 warns of its own unmasked shuffles.
  SM_TILE_INLINE static void turn(Vector (&t)[kWidth]) {
    constexpr __mmask8 kAll = 0xff;
    Vector s[kWidth];
#pragma GCC unroll 4
    for (int i = 0; i < kWidth; i += 2) {
      s[i] = _mm512_maskz_unpacklo_pd(kAll, t[i], t[i + 1]);
      s[i + 1] = _mm512_maskz_unpackhi_pd(kAll, t[i], t[i + 1]);
    }
#pragma GCC unroll 2
    for (int i = 0; i < kWidth; i += 4) {
#pragma GCC unroll 2
      for (int j = i; j < i + 2; ++j) {
        t[j] = _mm512_maskz_shuffle_f64x2(kAll, s[j], s[j + 2], 0x88);
        t[j + 2] = _mm512_maskz_shuffle_f64x2(kAll, s[j], s[j + 2], 0xdd);
      }
    }
#pragma GCC unroll 4
    for (int i = 0; i < kWidth / 2; ++i) {
      s[i] = _mm512_maskz_shuffle_f64x2(kAll, t[i], t[i + 4], 0x88);
      s[i + 4] = _mm512_maskz_shuffle_f64x2(kAll, t[i], t[i + 4], 0xdd);
    }
#pragma GCC unroll 8
    for (int i = 0; i < kWidth; ++i) t[i] = s[i];
  }
  SM_TILE_INLINE static Vector add(Vector a, Vector b) { return _mm512_add_pd(a, b); }
  SM_TILE_INLINE static Vector fma(Vector a, Vector b, Vector c) { return _mm512_fmadd_pd(a, b, c); }
};

#include "cholesky/tiles_body.hpp"
//
#include "cholesky/small_body.hpp"
//
#include "cholesky/small_inverse_body.hpp"

// Which of eight columns the row has. No branch: where rows lack columns, it could not be guessed.
SM_TILE_INLINE __mmask8 columns_found(__m512i column, const i64* own) {
  const auto at = [&](int i) SM_TILE_TARGET { return _mm512_cmpeq_epi64_mask(column, _mm512_set1_epi64(own[i])); };
  return static_cast<__mmask8>(((at(0) | at(1)) | (at(2) | at(3))) | ((at(4) | at(5)) | (at(6) | at(7))));
}

SM_TILE_TARGET i64 expand(const i64* column, i64 columns, const i64* own, i64 own_count, const double* value,
                          double* panel, i64 tile_step) {
  constexpr i64 kColumns = X::kVectors * X::kWidth;
  i64 found = 0;
  for (i64 j = 0; j < columns; j += kColumns, panel += tile_step) {
    for (i64 x = 0; x < kColumns; x += X::kWidth) {
      const i64 left = own_count - found;
      const i64 lanes = std::min(X::kWidth, columns - j - x);
      if (left <= 0 || lanes <= 0) {
        X::store(panel + x, X::zero());
        continue;
      }
      const __m512i none = _mm512_set1_epi64(-1);
      const __m512i here = _mm512_mask_loadu_epi64(none, X::mask(static_cast<int>(lanes)), column + j + x);
      alignas(64) i64 few[X::kWidth];
      const i64* next = own + found;
      X::Vector values;
      if (left >= X::kWidth) {
        values = X::load(value + found);
      } else {
        const __mmask8 last = X::mask(static_cast<int>(left));
        _mm512_store_si512(few, _mm512_mask_loadu_epi64(_mm512_set1_epi64(-2), last, next));
        next = few;
        values = X::load(value + found, static_cast<int>(left));
      }
      const __mmask8 has = columns_found(here, next);
      X::store(panel + x, _mm512_maskz_expand_pd(has, values));
      found += std::popcount(has);
    }
  }
  return found;
}

const TileKernels kKernels = {"AVX-512", X::kRows, X::kVectors* X::kWidth, strip,      pack,        multiply_rows, turn,
                              expand,    spread,   factor_small,           add_square, invert_small};

}  // namespace

const TileKernels* const kAvx512Tiles = &kKernels;

}  // namespace sm

#else

const sm::TileKernels* const sm::kAvx512Tiles = nullptr;

#endif
