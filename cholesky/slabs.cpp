// Between the packed layouts and the slabs, a square of 24 at a time: its rows lie far apart in a packed triangle, and
// a page of each serves the next squares too.
#include "cholesky/slabs.hpp"

#include "store/layouts.hpp"

namespace sm {

namespace {

// Calls f(packed position, slab element) for the upper triangle, down the columns or along the rows of each square,
// whichever is contiguous in the packed layout.
template <class Layout, class F>
void for_each_element(const Layout& layout, const Slabs& slabs, i64 row, i64 column, F&& f) {
  const i64 n = slabs.n();
  double* square = slabs.upper(row, column);
  const i64 columns = std::min(kSlab, n - column);
  for (i64 r = 0; r < std::min(kSlab, n - row); ++r) {
    for (i64 c = row == column ? r : 0; c < columns; ++c) f(layout.at(row + r, column + c), square[r * kSlab + c]);
  }
}

template <class F>
void for_each_square(const Slabs& slabs, F&& f) {
  for (i64 row = 0; row < slabs.order(); row += kSlab) {
    for (i64 column = row; column < slabs.order(); column += kSlab) f(row, column);
  }
}

}  // namespace

void Slabs::load(const double* array, std::int32_t format) const {
  with_packed(format, n_, [&](auto layout) {
    for_each_square(*this, [&](i64 row, i64 column) {
      if (row == column || column + kSlab > n_) std::fill_n(upper(row, column), kSlab * kSlab, 0.0);
      for_each_element(layout, *this, row, column, [&](i64 position, double& element) { element = array[position]; });
    });
  });
}

void Slabs::store(double* array, std::int32_t format) const {
  with_packed(format, n_, [&](auto layout) {
    for_each_square(*this, [&](i64 row, i64 column) {
      for_each_element(layout, *this, row, column, [&](i64 position, double element) { array[position] = element; });
    });
  });
}

}  // namespace sm
