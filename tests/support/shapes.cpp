#include "support/shapes.hpp"

// The large sizes that are asked for here are refused by malloc; the sanitizer would end the program instead.
extern "C" __attribute__((visibility("default"))) const char* __asan_default_options();
extern "C" const char* __asan_default_options() { return "allocator_may_return_null=1"; }

namespace sm::test {

std::string name_of(Shape shape) {
  const char* kind = shape.kind == SM_KIND_GENERAL ? "general " : "symmetric ";
  if (shape.kind == SM_KIND_DIAGONAL) kind = "diagonal ";
  return kind + std::to_string(shape.format);
}

bool has_place(Shape shape, std::int64_t row, std::int64_t col) {
  if (shape.kind == SM_KIND_DIAGONAL) return row == col;
  return shape.kind == SM_KIND_GENERAL || row <= col;
}

std::int64_t slots(Shape shape, std::int64_t rows, std::int64_t cols) {
  return lay_out(shape, rows, cols, [](std::int64_t, std::int64_t, std::int64_t) {});
}

std::int64_t slot_of(Shape shape, std::int64_t rows, std::int64_t cols, std::int64_t row, std::int64_t col) {
  std::int64_t found = -1;
  lay_out(shape, rows, cols, [&](std::int64_t r, std::int64_t c, std::int64_t slot) {
    if (r == row && c == col) found = slot;
  });
  return found;
}

std::int64_t packed_position(std::int64_t n, std::int32_t format, std::int64_t r, std::int64_t c) {
  return format == SM_FORMAT_COLUMNS ? r + c * (c + 1) / 2 : r * n - r * (r - 1) / 2 + (c - r);
}

}  // namespace sm::test
