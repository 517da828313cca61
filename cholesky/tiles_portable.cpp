// Tile kernels for any CPU, on vectors of two: strips of 4 rows, tiles of 4 columns. No fused multiply-add, so that the
// factor has the same bits everywhere.
#include <algorithm>
#include <cstring>

#include "cholesky/blocks.hpp"
#include "cholesky/tiles.hpp"

#define SM_TILE_TARGET
#define SM_TILE_INLINE __attribute__((always_inline)) inline

namespace sm {

namespace {

struct X {
  using Vector = double __attribute__((vector_size(16)));
  static constexpr i64 kWidth = 2;
  static constexpr int kRows = 4;
  static constexpr int kVectors = 2;

  SM_TILE_INLINE static Vector zero() { return Vector{0.0, 0.0}; }
  SM_TILE_INLINE static Vector all(double x) { return Vector{x, x}; }
  SM_TILE_INLINE static Vector load(const double* p) {
    Vector v;
    std::memcpy(&v, p, sizeof v);
    return v;
  }
  SM_TILE_INLINE static Vector load(const double* p, int n) { return n == kWidth ? load(p) : Vector{*p, 0.0}; }
  SM_TILE_INLINE static void store(double* p, Vector v) { std::memcpy(p, &v, sizeof v); }
  SM_TILE_INLINE static void store(double* p, Vector v, int n) { std::memcpy(p, &v, sizeof(double) * n); }
  SM_TILE_INLINE static void turn(Vector (&t)[kWidth]) {
    const Vector first = {t[0][0], t[1][0]};
    t[1] = Vector{t[0][1], t[1][1]};
    t[0] = first;
  }
  SM_TILE_INLINE static Vector add(Vector a, Vector b) { return a + b; }
  SM_TILE_INLINE static Vector fma(Vector a, Vector b, Vector c) { return a * b + c; }
};

#include "cholesky/tiles_body.hpp"
//
#include "cholesky/small_body.hpp"
//
#include "cholesky/small_inverse_body.hpp"

const TileKernels kKernels = {"portable",    X::kRows,    X::kVectors* X::kWidth, strip,  pack,
                              multiply_rows, turn,        expand_plain,           spread, factor_small,
                              add_square,    invert_small};

}  // namespace

const TileKernels* const kPortableTiles = &kKernels;

}  // namespace sm
