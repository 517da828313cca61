// Every shape that a matrix can have, and where each layout puts its elements, found without the module.
#pragma once

#include <qxesm/qxesm.h>

#include <cstddef>
#include <cstdint>
#include <limits>
#include <string>

namespace sm::test {

constexpr std::int64_t kHuge = std::numeric_limits<std::int64_t>::max();
constexpr std::int64_t kLeast = std::numeric_limits<std::int64_t>::min();
constexpr double kNan = std::numeric_limits<double>::quiet_NaN();
constexpr double kInfinity = std::numeric_limits<double>::infinity();

inline std::size_t at(std::int64_t i) { return static_cast<std::size_t>(i); }

struct Shape {
  std::int32_t kind;
  std::int32_t format;
  bool operator==(const Shape&) const = default;
};
constexpr Shape kGeneralSparse{SM_KIND_GENERAL, SM_FORMAT_SPARSE};
constexpr Shape kGeneralColumns{SM_KIND_GENERAL, SM_FORMAT_COLUMNS};
constexpr Shape kGeneralRows{SM_KIND_GENERAL, SM_FORMAT_ROWS};
constexpr Shape kSymmetricSparse{SM_KIND_SYMMETRIC, SM_FORMAT_SPARSE};
constexpr Shape kSymmetricColumns{SM_KIND_SYMMETRIC, SM_FORMAT_COLUMNS};
constexpr Shape kSymmetricRows{SM_KIND_SYMMETRIC, SM_FORMAT_ROWS};
constexpr Shape kDiagonalColumns{SM_KIND_DIAGONAL, SM_FORMAT_COLUMNS};
constexpr Shape kDiagonalRows{SM_KIND_DIAGONAL, SM_FORMAT_ROWS};
inline constexpr Shape kShapes[] = {kGeneralSparse,    kGeneralColumns, kGeneralRows,     kSymmetricSparse,
                                    kSymmetricColumns, kSymmetricRows,  kDiagonalColumns, kDiagonalRows};
inline constexpr Shape kGeneralShapes[] = {kGeneralSparse, kGeneralColumns, kGeneralRows};
inline constexpr Shape kSymmetricShapes[] = {kSymmetricSparse, kSymmetricColumns, kSymmetricRows};
inline constexpr Shape kDiagonalShapes[] = {kDiagonalColumns, kDiagonalRows};
inline constexpr Shape kInvertible[] = {kSymmetricSparse, kSymmetricColumns, kSymmetricRows, kDiagonalColumns,
                                        kDiagonalRows};
inline constexpr Shape kDense[] = {kGeneralColumns, kGeneralRows,     kSymmetricColumns,
                                   kSymmetricRows,  kDiagonalColumns, kDiagonalRows};
inline constexpr Shape kPacked[] = {kSymmetricColumns, kSymmetricRows};
inline constexpr Shape kSquareFactored[] = {kSymmetricColumns, kSymmetricRows, kDiagonalColumns, kDiagonalRows};

std::string name_of(Shape shape);
inline Shape shape_of(const SmMatrix* matrix) { return {matrix->kind, matrix->format}; }
inline bool is_sparse(Shape shape) { return shape.format == SM_FORMAT_SPARSE; }
// Whether the shape has a place for the element: a symmetric one keeps the upper triangle.
bool has_place(Shape shape, std::int64_t row, std::int64_t col);

// Lays the elements of a dense or diagonal shape out one after the other, calling visit(row, col, slot) for each; the
// number of slots.
template <class Visit>
std::int64_t lay_out(Shape shape, std::int64_t rows, std::int64_t cols, Visit visit) {
  const bool by_cols = shape.format == SM_FORMAT_COLUMNS;
  std::int64_t slot = 0;
  for (std::int64_t outer = 0; outer < (by_cols ? cols : rows); ++outer)
    for (std::int64_t inner = 0; inner < (by_cols ? rows : cols); ++inner) {
      const std::int64_t r = by_cols ? inner : outer;
      const std::int64_t c = by_cols ? outer : inner;
      if (has_place(shape, r, c)) visit(r, c, slot++);
    }
  return slot;
}

// Value slots of a dense or diagonal shape, counted by laying the elements out.
std::int64_t slots(Shape shape, std::int64_t rows, std::int64_t cols);
// The slot of an element, found the same way; -1 when the layout has none for it.
std::int64_t slot_of(Shape shape, std::int64_t rows, std::int64_t cols, std::int64_t row, std::int64_t col);
// The slot of element (r, c), r <= c, of a packed triangle.
std::int64_t packed_position(std::int64_t n, std::int32_t format, std::int64_t r, std::int64_t c);

}  // namespace sm::test
