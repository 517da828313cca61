// Products with rows that are kept as trees.
#pragma once

#include "forms/operations.hpp"
#include "store/views.hpp"

namespace sm {

// y += A[rows, cols] x for the vectors of the block.
void add_tree_product(const TreeRows& a, const Block& block, Range rows, Range cols);
// y += A' x. A row is left out for a vector that has an exact zero there.
void add_transposed_tree_product(const TreeRows& a, const Block& block);

}  // namespace sm
