#include "support/random_matrices.hpp"

#include <algorithm>
#include <cmath>
#include <numeric>

#include "support/shapes.hpp"

namespace sm::test {

namespace {

using Edge = std::pair<std::int64_t, std::int64_t>;

Graph sorted(Graph graph) {
  for (Edge& e : graph.edges)
    if (e.first > e.second) std::swap(e.first, e.second);
  std::sort(graph.edges.begin(), graph.edges.end());
  graph.edges.erase(std::unique(graph.edges.begin(), graph.edges.end()), graph.edges.end());
  return graph;
}

}  // namespace

std::uint64_t Random::next() {
  s_ = s_ * 6364136223846793005U + 1442695040888963407U;
  return (s_ ^ (s_ >> 31U)) >> 16U;
}

double Random::dyadic() {
  const std::int64_t k = below(1023) - 511;
  return static_cast<double>(k == 0 ? 512 : k) / 64.0;
}

std::vector<double> Random::vector(std::int64_t n) {
  std::vector<double> x;
  for (std::int64_t i = 0; i < n; ++i) x.push_back(dyadic());
  return x;
}

std::vector<std::int64_t> Random::permutation(std::int64_t n) {
  std::vector<std::int64_t> p(at(n));
  std::iota(p.begin(), p.end(), 0);
  for (std::int64_t i = n - 1; i > 0; --i) std::swap(p[at(i)], p[at(below(i + 1))]);
  return p;
}

Graph empty_graph(std::int64_t n) { return {n, {}}; }

Graph random_graph(Random& random, std::int64_t n, std::int64_t percent) {
  Graph g{n, {}};
  for (std::int64_t i = 0; i < n; ++i)
    for (std::int64_t j = i + 1; j < n; ++j)
      if (random.chance(percent)) g.edges.emplace_back(i, j);
  return g;
}

Graph path(std::int64_t n) {
  Graph g{n, {}};
  for (std::int64_t i = 0; i + 1 < n; ++i) g.edges.emplace_back(i, i + 1);
  return g;
}

Graph star(std::int64_t n, std::int64_t hub) {
  Graph g{n, {}};
  for (std::int64_t i = 0; i < n; ++i)
    if (i != hub) g.edges.emplace_back(i, hub);
  return sorted(g);
}

Graph clique(std::int64_t n) {
  Graph g{n, {}};
  for (std::int64_t i = 0; i < n; ++i)
    for (std::int64_t j = i + 1; j < n; ++j) g.edges.emplace_back(i, j);
  return g;
}

Graph grid(std::int64_t width, std::int64_t height) {
  Graph g{width * height, {}};
  for (std::int64_t y = 0; y < height; ++y)
    for (std::int64_t x = 0; x < width; ++x) {
      if (x + 1 < width) g.edges.emplace_back(y * width + x, y * width + x + 1);
      if (y + 1 < height) g.edges.emplace_back(y * width + x, (y + 1) * width + x);
    }
  return sorted(g);
}

Graph random_tree(Random& random, std::int64_t n) {
  Graph g{n, {}};
  for (std::int64_t i = 1; i < n; ++i) g.edges.emplace_back(random.below(i), i);
  return sorted(g);
}

Graph arrowhead(std::int64_t n, std::int64_t border) {
  Graph g{n, {}};
  for (std::int64_t j = std::max<std::int64_t>(0, n - border); j < n; ++j)
    for (std::int64_t i = 0; i < j; ++i) g.edges.emplace_back(i, j);
  return sorted(g);
}

Graph blocks(Random& random, std::int64_t count, std::int64_t size) {
  Graph g{count * size, {}};
  for (std::int64_t b = 0; b < count; ++b)
    for (const Edge& e : random_graph(random, size, 80).edges)
      g.edges.emplace_back(b * size + e.first, b * size + e.second);
  return sorted(g);
}

Graph elements(Random& random, std::int64_t n, std::int64_t count, std::int64_t size) {
  Graph g{n, {}};
  for (std::int64_t e = 0; n > 0 && e < count; ++e) {
    std::vector<std::int64_t> nodes;
    for (std::int64_t k = 0; k < size; ++k) nodes.push_back(random.below(n));
    for (const std::int64_t i : nodes)
      for (const std::int64_t j : nodes)
        if (i < j) g.edges.emplace_back(i, j);
  }
  return sorted(g);
}

Graph multiplied(Random& random, const Graph& graph) {
  std::vector<std::vector<std::int64_t>> copies(at(graph.n));
  Graph g;
  for (auto& group : copies) {
    const std::int64_t count = 1 + random.below(3);
    for (std::int64_t k = 0; k < count; ++k) group.push_back(g.n++);
    if (random.chance(50)) continue;
    for (const std::int64_t i : group)
      for (const std::int64_t j : group)
        if (i < j) g.edges.emplace_back(i, j);
  }
  for (const Edge& e : graph.edges)
    for (const std::int64_t i : copies[at(e.first)])
      for (const std::int64_t j : copies[at(e.second)]) g.edges.emplace_back(i, j);
  return sorted(g);
}

Graph relabelled(const Graph& graph, const std::vector<std::int64_t>& label) {
  Graph g{graph.n, {}};
  for (const Edge& e : graph.edges) g.edges.emplace_back(label[at(e.first)], label[at(e.second)]);
  return sorted(g);
}

Graph any_graph(Random& random, std::int64_t limit) {
  const std::int64_t n = random.below(limit);
  const std::int64_t side = 1 + random.below(std::max<std::int64_t>(1, static_cast<std::int64_t>(std::sqrt(n))));
  Graph g;
  switch (random.below(11)) {
    case 0:
      g = empty_graph(n);
      break;
    case 1:
      g = path(n);
      break;
    case 2:
      g = star(n, n == 0 ? 0 : random.below(n));
      break;
    case 3:
      g = clique(n / 3);
      break;
    case 4:
      g = grid(side, n / side);
      break;
    case 5:
      g = random_tree(random, n);
      break;
    case 6:
      g = arrowhead(n, random.below(5));
      break;
    case 7:
      g = blocks(random, n / side, side);
      break;
    default:
      g = random_graph(random, n, random.below(60));
      break;
  }
  return random.chance(50) ? relabelled(g, random.permutation(g.n)) : g;
}

Dense random_dense(Random& random, std::int64_t rows, std::int64_t cols, std::int64_t percent) {
  Dense a(rows, cols);
  for (std::int64_t r = 0; r < rows; ++r)
    for (std::int64_t c = 0; c < cols; ++c)
      if (random.chance(percent)) a(r, c) = random.dyadic();
  return a;
}

Dense random_symmetric(Random& random, std::int64_t n, std::int64_t percent) {
  Dense a(n, n);
  for (std::int64_t r = 0; r < n; ++r)
    for (std::int64_t c = r; c < n; ++c)
      if (r == c || random.chance(percent)) a(r, c) = a(c, r) = random.dyadic();
  return a;
}

Dense Problem::dense() const {
  Dense a(n, n);
  for (const Entry& e : upper) {
    a(e.row, e.col) = e.value;
    a(e.col, e.row) = e.value;
  }
  return a;
}

Problem positive_definite(const Graph& graph, Random& random) {
  std::vector<double> diagonal;
  for (std::int64_t i = 0; i < graph.n; ++i) diagonal.push_back(1.0 + std::fabs(random.dyadic()));
  std::vector<Entry> upper;
  for (const Edge& e : graph.edges) {
    const double v = random.dyadic();
    diagonal[at(e.first)] += std::fabs(v);
    diagonal[at(e.second)] += std::fabs(v);
    upper.push_back({e.first, e.second, v});
  }
  for (std::int64_t i = 0; i < graph.n; ++i) upper.push_back({i, i, diagonal[at(i)]});
  std::sort(upper.begin(), upper.end(),
            [](const Entry& a, const Entry& b) { return std::pair(a.row, a.col) < std::pair(b.row, b.col); });
  return {"positive definite", graph.n, upper};
}

Semidefinite cross_product(Random& random, std::int64_t distinct, std::int64_t repeated, std::int64_t zero) {
  const std::int64_t n = distinct + repeated + zero;
  // source[j]: which unit vector column j of T is, or -1 for a zero column.
  std::vector<std::int64_t> source(at(n), -1);
  std::iota(source.begin(), source.begin() + distinct, 0);
  for (std::int64_t r = 0; r < repeated; ++r) source[at(distinct + r)] = random.below(distinct);
  const std::vector<std::int64_t> place = random.permutation(n);

  Dense s = identity(distinct);  // I + R'R
  for (std::int64_t row = 0; row < distinct; ++row) {
    std::vector<std::pair<std::int64_t, double>> r;
    for (int e = 0; e < 3; ++e) r.emplace_back(random.below(distinct), random.dyadic() / 4.0);
    for (const auto& [i, a] : r)
      for (const auto& [j, b] : r) s(i, j) += a * b;
  }
  Semidefinite result{{"cross product", n, {}}, distinct};
  for (std::int64_t i = 0; i < n; ++i)
    for (std::int64_t j = i; j < n; ++j) {
      const std::int64_t a = source[at(place[at(i)])];
      const std::int64_t b = source[at(place[at(j)])];
      const double v = a < 0 || b < 0 ? 0.0 : static_cast<double>(s(a, b));
      if (v != 0.0 || i == j) result.problem.upper.push_back({i, j, v});
    }
  return result;
}

}  // namespace sm::test
