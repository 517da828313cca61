// What `info` says about a matrix beyond its entries.
#pragma once

#include <cstdint>
#include <vector>

#include "cli/sparse.hpp"

namespace sm::cli {

// Connected components of the graph whose vertices are the rows and columns, one vertex for row i and column i when the
// matrix is square, and whose edges are the entries. A square matrix is block diagonal, after a permutation, with one
// block for each component.
struct Blocks {
  std::int64_t count = 0;
  std::int64_t largest = 0;  // vertices
};
// `limit` as in require_memory.
Blocks find_blocks(const CompressedRows& rows, std::uint64_t limit);

struct Diagonal {
  std::int64_t present = 0;
  double smallest = 0.0;  // of those present
  double largest = 0.0;
  std::vector<std::int64_t> missing;  // rows without a diagonal entry, from 1
};
Diagonal inspect_diagonal(const CompressedRows& rows);

// Bytes that the pools hand out for a symmetric matrix of that order with that many entries in its upper triangle, the
// diagonal included. The factor needs what its fill asks for, which only the ordering tells.
struct MemoryNeed {
  double assembling = 0.0;  // the trees of nonzeros, and the compressed rows that closing makes of them
  double ordering = 0.0;    // the compressed rows, the permutation and the first workspace
};
MemoryNeed estimate_memory(std::int64_t order, std::int64_t entries);

}  // namespace sm::cli
