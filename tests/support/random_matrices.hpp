// Graphs and symmetric matrices from seeds. Values are multiples of 1/64, so that assembly and small sums are exact.
#pragma once

#include <cstdint>
#include <string>
#include <utility>
#include <vector>

#include "support/dense_reference.hpp"

namespace sm::test {

// One multiplicative congruential stream for each seed: the same problems on every machine.
class Random {
 public:
  explicit Random(std::uint64_t seed) : s_(seed * 0x9E3779B97F4A7C15U + 0x632BE59BD9B4E019U) {}
  std::uint64_t next();
  std::int64_t below(std::int64_t n) { return static_cast<std::int64_t>(next() % static_cast<std::uint64_t>(n)); }
  bool chance(std::int64_t percent) { return below(100) < percent; }
  double dyadic();  // a multiple of 1/64 in [-8, 8), not 0
  std::vector<double> vector(std::int64_t n);
  std::vector<std::int64_t> permutation(std::int64_t n);

 private:
  std::uint64_t s_;
};

// Edges i < j, by row and then by column, each once.
struct Graph {
  std::int64_t n = 0;
  std::vector<std::pair<std::int64_t, std::int64_t>> edges;
};

Graph empty_graph(std::int64_t n);
Graph random_graph(Random& random, std::int64_t n, std::int64_t percent);
Graph path(std::int64_t n);
Graph star(std::int64_t n, std::int64_t hub);
Graph clique(std::int64_t n);
Graph grid(std::int64_t width, std::int64_t height);
Graph random_tree(Random& random, std::int64_t n);
Graph arrowhead(std::int64_t n, std::int64_t border);                 // the last `border` vertices touch everything
Graph blocks(Random& random, std::int64_t count, std::int64_t size);  // dense blocks without a link
// Cliques that overlap, as finite elements do: many vertices become indistinguishable on the way.
Graph elements(Random& random, std::int64_t n, std::int64_t count, std::int64_t size);
// Every vertex becomes one to three copies with the same neighbours; the copies touch each other or not.
Graph multiplied(Random& random, const Graph& graph);
Graph relabelled(const Graph& graph, const std::vector<std::int64_t>& label);
// One of the families above, of an order below `limit`.
Graph any_graph(Random& random, std::int64_t limit);

// Multiples of 1/64, about `percent` of them stored; symmetric ones have a full diagonal.
Dense random_dense(Random& random, std::int64_t rows, std::int64_t cols, std::int64_t percent = 100);
Dense random_symmetric(Random& random, std::int64_t n, std::int64_t percent = 100);

struct Entry {
  std::int64_t row;
  std::int64_t col;
  double value;
};

// A symmetric matrix by its upper triangle, every diagonal present, by row and then by column.
struct Problem {
  std::string name;
  std::int64_t n = 0;
  std::vector<Entry> upper;
  Dense dense() const;
};

// Strictly diagonally dominant on the pattern of the graph.
Problem positive_definite(const Graph& graph, Random& random);
// B'B for B = [I; R] T with sparse R: the columns of T are unit vectors, some repeated, some zero. Its rank is the
// number of different unit vectors, and its accepted pivots are not small.
struct Semidefinite {
  Problem problem;
  std::int64_t rank = 0;
};
Semidefinite cross_product(Random& random, std::int64_t distinct, std::int64_t repeated, std::int64_t zero);

}  // namespace sm::test
