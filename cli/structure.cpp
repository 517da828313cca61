#include "cli/structure.hpp"

#include <fmt/core.h>

#include <algorithm>
#include <cmath>
#include <numeric>

namespace sm::cli {
namespace {

std::size_t at(std::int64_t i) { return static_cast<std::size_t>(i); }

// Disjoint sets with path halving and union by size.
// R. Tarjan, J. van Leeuwen, "Worst-case analysis of set union algorithms", JACM 31 (1984) 245-281.
class Sets {
 public:
  explicit Sets(std::int64_t n) : parent_(at(n)), size_(at(n), 1) { std::iota(parent_.begin(), parent_.end(), 0); }

  std::int64_t find(std::int64_t i) {
    while (parent_[at(i)] != i) {
      parent_[at(i)] = parent_[at(parent_[at(i)])];
      i = parent_[at(i)];
    }
    return i;
  }

  void join(std::int64_t i, std::int64_t j) {
    i = find(i);
    j = find(j);
    if (i == j) return;
    if (size_[at(i)] < size_[at(j)]) std::swap(i, j);
    parent_[at(j)] = i;
    size_[at(i)] += size_[at(j)];
  }

  std::int64_t size(std::int64_t i) { return parent_[at(i)] == i ? size_[at(i)] : 0; }  // 0 for all but one of a set

 private:
  std::vector<std::int64_t> parent_;
  std::vector<std::int64_t> size_;
};

}  // namespace

Blocks find_blocks(const CompressedRows& rows, std::uint64_t limit) {
  const bool square = rows.rows == rows.cols;
  const std::int64_t vertices = square ? rows.rows : rows.rows + rows.cols;
  const std::int64_t first_column = square ? 0 : rows.rows;
  require_memory(16.0 * static_cast<double>(vertices), limit, fmt::format("the blocks of {} vertices", vertices));
  Sets sets(vertices);
  for (std::int64_t i = 0; i < rows.rows; ++i) {
    for (std::int64_t p = rows.start[at(i)]; p < rows.start[at(i + 1)]; ++p)
      sets.join(i, first_column + rows.col[at(p)]);
  }
  Blocks blocks;
  for (std::int64_t i = 0; i < vertices; ++i) {
    const std::int64_t size = sets.size(i);
    blocks.count += size > 0 ? 1 : 0;
    blocks.largest = std::max(blocks.largest, size);
  }
  return blocks;
}

Diagonal inspect_diagonal(const CompressedRows& rows) {
  Diagonal diagonal;
  for (std::int64_t i = 0; i < std::min(rows.rows, rows.cols); ++i) {
    const auto place = find_entry(rows, i, i);
    if (!place) {
      diagonal.missing.push_back(i + 1);
      continue;
    }
    const double value = rows.value[at(*place)];
    diagonal.smallest = diagonal.present == 0 ? value : std::min(diagonal.smallest, value);
    diagonal.largest = diagonal.present == 0 ? value : std::max(diagonal.largest, value);
    ++diagonal.present;
  }
  return diagonal;
}

MemoryNeed estimate_memory(std::int64_t order, std::int64_t entries) {
  // Nodes of 32 bytes come in slabs, whose length depends on the order; root words come with at least 20 a matrix.
  const double n = static_cast<double>(order);
  const double nnz = static_cast<double>(entries);
  const double roots = std::max(n, 20.0);
  const double slab = roots >= 50'000.0 ? 1'000'000.0 : 20.0 * roots;
  const double nodes = slab * std::ceil((nnz + 1.0) / slab);  // one node is always kept ready
  const double compressed = 8.0 * (n + 1.0) + 16.0 * nnz;
  MemoryNeed need;
  need.assembling = 32.0 * nodes + 8.0 * roots + compressed;
  need.ordering = compressed + 16.0 * n + 8.0 * (4.0 * n + 5.0 * nnz);
  return need;
}

}  // namespace sm::cli
