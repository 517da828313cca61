// The cross products G = M'WM of a design, M = [Z~ X~], in blocks: one row and column of blocks for each level of each
// random term, in the order of the unknowns, and one for each column of X. Blocks are stored where G or the precision
// of the random effects is not zero, those of the upper triangle.
#pragma once

#include <cstdint>
#include <span>
#include <vector>

#include "mixed/scaled_design.hpp"

namespace sm::mixed {

class Gram {
 public:
  explicit Gram(const ScaledDesign& design);

  std::int64_t nodes() const { return static_cast<std::int64_t>(start_.size()) - 1; }
  std::int64_t random_nodes() const { return random_nodes_; }
  // The term that a node is a level of; the number of terms for a column of X.
  std::size_t term_of(std::int64_t node) const;
  std::int64_t size_of(std::size_t term) const { return size_[term]; }           // unknowns of a node
  std::int64_t first_node(std::size_t term) const { return first_node_[term]; }  // one past the last term: of X
  std::int64_t unknown_of(std::size_t term, std::int64_t node) const {           // the first of a node
    return first_unknown_[term] + (node - first_node_[term]) * size_[term];
  }

  // Blocks of a node's row: nodes from itself on, ascending.
  std::span<const std::int32_t> columns(std::int64_t node) const {
    return {column_.data() + start_[index(node)], column_.data() + start_[index(node + 1)]};
  }
  // Their values one after the other, each by rows.
  const double* values(std::int64_t node) const { return value_.data() + value_start_[index(node)]; }

  // y <- y + G x
  void add_product(std::span<const double> x, std::span<double> y) const;

  double bytes() const;

 private:
  static std::size_t index(std::int64_t i) { return static_cast<std::size_t>(i); }
  void number_nodes(const ScaledDesign& design);
  void add_product_of_single_unknowns(std::span<const double> x, std::span<double> y) const;

  std::int64_t random_nodes_ = 0;
  bool single_ = true;  // every node is one unknown, of the same number
  std::vector<std::int64_t> first_node_;
  std::vector<std::int64_t> first_unknown_;
  std::vector<std::int64_t> size_;
  std::vector<std::int64_t> start_;
  std::vector<std::int32_t> column_;
  std::vector<std::int64_t> value_start_;
  std::vector<double> value_;
};

}  // namespace sm::mixed
