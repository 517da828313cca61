// The copy of a packed triangle that the blocked ginverse2 works in: slabs of 24 columns, row after row.
//
// Any number of rows of a slab are one source of the tile kernels where they stand, and its strips are their targets:
// nothing is packed but the few coefficients. Slabs are grouped in bands of 120 columns. The storage of a band holds
// either the upper triangle there, all rows of its columns, or the lower one, all columns of its rows: an inversion
// passes from one to the other in place. The order is rounded up to whole slabs; what is beyond n is 0, and a pivot
// there counts as dropped.
#pragma once

#include <algorithm>

#include "cholesky/tiles.hpp"
#include "frame/core.hpp"

namespace sm {

inline constexpr i64 kSlab = 24;  // a multiple of the rows and of the columns of every tile
inline constexpr i64 kBand = 5 * kSlab;

// Columns first .. end - 1 of the upper triangle (rows 0 .. end - 1), or rows first .. end - 1 of the lower one.
struct Band {
  i64 first;
  i64 width;
  double* data;

  i64 end() const { return first + width; }
  i64 size() const { return width * end(); }
  double* upper(i64 row, i64 column) const {
    const i64 c = column - first;
    return data + c / kSlab * kSlab * end() + row * kSlab + c % kSlab;
  }
  double* lower(i64 row, i64 column) const {
    return data + column / kSlab * kSlab * width + (row - first) * kSlab + column % kSlab;
  }
};

class Slabs {
 public:
  static i64 rounded(i64 n) { return (n + kSlab - 1) / kSlab * kSlab; }
  // Doubles for a triangle of order n.
  static i64 size(i64 n) {
    const i64 order = rounded(n);
    const i64 full = order / kBand * kBand;
    return full * (full + kBand) / 2 + (order - full) * order;
  }

  Slabs(double* data, i64 n) : data_(data), n_(n), order_(rounded(n)) {}
  i64 n() const { return n_; }
  i64 order() const { return order_; }
  // Bands begin at multiples of kBand.
  Band band(i64 first) const { return {first, std::min(kBand, order_ - first), data_ + first * (first + kBand) / 2}; }
  double* upper(i64 row, i64 column) const { return band(column / kBand * kBand).upper(row, column); }

  void load(const double* array, std::int32_t format) const;
  void store(double* array, std::int32_t format) const;

 private:
  double* data_;
  i64 n_;
  i64 order_;
};

// The chosen kernels on the strips of a slab.
struct SlabTiles {
  const TileKernels& kernels = tile_kernels();
  i64 height = kernels.strip_rows;

  // The first `columns` columns of the strip at `to`.
  void strip(const double* coefficient, i64 depth, const double* source, double* to, Finish finish,
             i64 columns = kSlab) const {
    double* target[kMostStripRows] = {};
    for (i64 i = 0; i < height; ++i) target[i] = to + i * kSlab;
    kernels.strip(static_cast<int>(height), depth, coefficient, {source, kSlab, 0, kernels.tile_columns}, columns,
                  target, finish);
  }
  // The coefficients of a strip: sign times as many columns as it has rows, from `depth` rows.
  void pack(const double* from, i64 depth, double sign, double* out) const {
    for (i64 s = 0; s < depth; ++s, from += kSlab, out += height) {
      for (i64 i = 0; i < height; ++i) out[i] = sign * from[i];
    }
  }
};

}  // namespace sm
