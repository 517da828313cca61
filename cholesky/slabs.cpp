// Between the packed layouts and the slabs, a square of 24 at a time in the order of the packed layout: 24 of its
// columns, or rows, lie on as many pages, which serve the next squares too.
#include "cholesky/slabs.hpp"

#include "store/layouts.hpp"

namespace sm {

namespace {

// Calls f(packed position, slab element) for the upper triangle's part of a square, along what is contiguous in the
// packed layout.
template <class F>
void for_each_element(const PackedColumns& layout, const Slabs& slabs, i64 row, i64 column, F&& f) {
  double* square = slabs.upper(row, column);
  const i64 columns = std::min(kSlab, layout.n - column);
  for (i64 c = 0; c < columns; ++c) {
    const i64 position = layout.at(row, column + c);
    const i64 rows = row == column ? c + 1 : kSlab;
    for (i64 r = 0; r < rows; ++r) f(position + r, square[r * kSlab + c]);
  }
}
template <class F>
void for_each_element(const PackedRows& layout, const Slabs& slabs, i64 row, i64 column, F&& f) {
  double* square = slabs.upper(row, column);
  const i64 columns = std::min(kSlab, layout.n - column);
  const i64 rows = std::min(kSlab, layout.n - row);
  for (i64 r = 0; r < rows; ++r) {
    const i64 position = layout.at(row + r, column);
    for (i64 c = row == column ? r : 0; c < columns; ++c) f(position + c, square[r * kSlab + c]);
  }
}

template <class F>
void for_each_square(const PackedColumns&, i64 order, F&& f) {
  for (i64 column = 0; column < order; column += kSlab) {
    for (i64 row = 0; row <= column; row += kSlab) f(row, column);
  }
}
template <class F>
void for_each_square(const PackedRows&, i64 order, F&& f) {
  for (i64 row = 0; row < order; row += kSlab) {
    for (i64 column = row; column < order; column += kSlab) f(row, column);
  }
}

}  // namespace

void Slabs::load(const double* array, std::int32_t format) const {
  with_packed(format, n_, [&](auto layout) {
    for_each_square(layout, order_, [&](i64 row, i64 column) {
      if (row == column || column + kSlab > n_) std::fill_n(upper(row, column), kSlab * kSlab, 0.0);
      for_each_element(layout, *this, row, column, [&](i64 position, double& element) { element = array[position]; });
    });
  });
}

void Slabs::store(double* array, std::int32_t format) const {
  with_packed(format, n_, [&](auto layout) {
    for_each_square(layout, order_, [&](i64 row, i64 column) {
      for_each_element(layout, *this, row, column, [&](i64 position, double element) { array[position] = element; });
    });
  });
}

}  // namespace sm
