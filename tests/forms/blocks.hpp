// Blocks of a matrix, and what multiplying by one gives.
#pragma once

#include "forms/forms_support.hpp"

namespace sm::test {

// Rows r0 to r1 and columns c0 to c1.
struct Block {
  std::int64_t r0, r1, c0, c1;
  std::int64_t height() const { return r1 - r0 + 1; }
  std::int64_t width() const { return c1 - c0 + 1; }
  bool holds(std::int64_t r, std::int64_t c) const { return r0 <= r && r <= r1 && c0 <= c && c <= c1; }
};

inline std::string name_of(const Block& b) {
  return "rows " + std::to_string(b.r0) + " to " + std::to_string(b.r1) + ", columns " + std::to_string(b.c0) + " to " +
         std::to_string(b.c1);
}

inline std::vector<Block> all_blocks(std::int64_t rows, std::int64_t cols) {
  std::vector<Block> blocks;
  for (std::int64_t r0 = 0; r0 < rows; ++r0)
    for (std::int64_t r1 = r0; r1 < rows; ++r1)
      for (std::int64_t c0 = 0; c0 < cols; ++c0)
        for (std::int64_t c1 = c0; c1 < cols; ++c1) blocks.push_back({r0, r1, c0, c1});
  return blocks;
}

// Whole matrices are served throughout, blocks not in every layout and state.
inline SmStatus answer_for(Operand operand, const Known& known, const Block& b) {
  if (b.height() == known.rows() && b.width() == known.cols()) return SM_OK;
  if (operand.shape == kSymmetricColumns) return SM_UNAVAILABLE;
  if (operand.shape == kSymmetricSparse && operand.state > SM_STATE_CLOSED) return SM_REORDERED;
  return SM_OK;
}

// start + the block times the k vectors in x, over stored elements; nothing for the block of a diagonal matrix whose
// columns reach past both ends of its rows.
inline std::vector<double> block_times(Shape shape, const Known& known, const Block& b, const std::vector<double>& x,
                                       std::int64_t k, std::vector<double> start) {
  if (shape.kind == SM_KIND_DIAGONAL && b.c0 < b.r0 && b.c1 > b.r1) return start;
  for (std::int64_t v = 0; v < k; ++v)
    for (std::int64_t r = b.r0; r <= b.r1; ++r)
      for (std::int64_t c = b.c0; c <= b.c1; ++c)
        if (known.has(r, c)) start[at(v * b.height() + r - b.r0)] += known(r, c) * x[at(v * b.width() + c - b.c0)];
  return start;
}

}  // namespace sm::test
