// The blocks of the mixed-model equations one after the other, with the places of their elements among the stored
// entries of the equations (rows of the upper triangle, columns ascending).
#pragma once

#include "mixed/gram.hpp"

namespace sm::mixed {

enum class Part { all, random };  // the equations of all unknowns, or of the random effects alone

struct Block {
  std::size_t t = 0;  // the term of the row's node, and of the column's
  std::size_t s = 0;
  std::int64_t node = 0;
  std::int64_t other = 0;
  std::size_t row = 0;  // the first unknowns of the two
  std::size_t col = 0;
  std::size_t k = 1;  // rows and columns
  std::size_t m = 1;
  const double* g = nullptr;               // of G, by rows
  double precision = 0.0;                  // what the precision adds to each element of the diagonal
  const std::size_t* row_place = nullptr;  // of each row of the block
  bool diagonal() const { return node == other; }
  std::size_t place(std::size_t a, std::size_t c) const { return row_place[a] + c; }  // on the diagonal c >= a
};

// Calls visit(block) for each block of the upper triangle, row by row.
template <class Visit>
void walk_blocks(const ScaledDesign& design, const Gram& gram, Part part, Visit visit) {
  const std::size_t terms = design.terms().size();
  const std::int64_t nodes = part == Part::all ? gram.nodes() : gram.random_nodes();
  std::vector<std::size_t> row_place;
  std::size_t next = 0;  // place of the first entry of the row of blocks
  for (Block block; block.node < nodes; ++block.node) {
    while (block.node >= gram.first_node(block.t + 1)) ++block.t;
    block.k = static_cast<std::size_t>(gram.size_of(block.t));
    block.row = static_cast<std::size_t>(gram.unknown_of(block.t, block.node));
    block.g = gram.values(block.node);
    const Precision* const precision = block.t < terms ? design.terms()[block.t].precision : nullptr;
    const std::int64_t level = block.node - gram.first_node(block.t);
    std::int64_t entry = precision ? precision->row_start[static_cast<std::size_t>(level)] : 0;
    const std::int64_t end = precision ? precision->row_start[static_cast<std::size_t>(level) + 1] : 0;

    std::size_t length = 0;  // of the first row
    block.s = block.t;
    for (const std::int32_t other : gram.columns(block.node)) {
      if (other >= nodes) break;
      while (other >= gram.first_node(block.s + 1)) ++block.s;
      length += static_cast<std::size_t>(gram.size_of(block.s));
    }
    row_place.resize(block.k);
    for (std::size_t a = 0; a < block.k; ++a) {
      row_place[a] = next - a;  // element (a, a) comes first
      next += length - a;
    }
    block.row_place = row_place.data();
    block.s = block.t;
    for (const std::int32_t other : gram.columns(block.node)) {
      if (other >= nodes) break;
      while (other >= gram.first_node(block.s + 1)) ++block.s;
      block.other = other;
      block.m = static_cast<std::size_t>(gram.size_of(block.s));
      block.col = static_cast<std::size_t>(gram.unknown_of(block.s, other));
      block.precision = !precision && block.diagonal() && block.t < terms ? 1.0 : 0.0;
      if (entry < end && gram.first_node(block.t) + precision->col[static_cast<std::size_t>(entry)] == other) {
        block.precision = precision->value[static_cast<std::size_t>(entry++)];
      }
      visit(static_cast<const Block&>(block));
      block.g += block.k * block.m;
      for (std::size_t a = 0; a < block.k; ++a) row_place[a] += block.m;
    }
  }
}

}  // namespace sm::mixed
