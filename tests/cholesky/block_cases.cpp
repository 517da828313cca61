#include "cholesky/block_cases.hpp"

#include <utility>

namespace sm::test {

Graph linked_cliques(Random& random, const Indices& sizes, std::int64_t percent) {
  Graph g;
  Indices first{0};
  for (const std::int64_t size : sizes) {
    for (std::int64_t i = 0; i < size; ++i)
      for (std::int64_t j = i + 1; j < size; ++j) g.edges.emplace_back(g.n + i, g.n + j);
    g.n += size;
    first.push_back(g.n);
  }
  for (std::size_t a = 0; a + 1 < sizes.size(); ++a)
    for (std::size_t b = a + 1; b < sizes.size(); ++b) {
      if (!random.chance(percent)) continue;
      const std::int64_t keep = 10 + random.below(91);
      for (std::int64_t j = first[b]; j < first[b + 1]; ++j)
        if (random.chance(keep)) g.edges.emplace_back(first[a] + random.below(sizes[a]), j);
    }
  return relabelled(g, natural_order(g.n));  // sorted, each edge once
}

Graph any_linked_cliques(Random& random) {
  Indices sizes;
  const std::int64_t count = 2 + random.below(14);
  for (std::int64_t k = 0; k < count; ++k) sizes.push_back(1 + random.below(random.chance(30) ? 40 : 9));
  return linked_cliques(random, sizes, 20 + random.below(60));
}

std::vector<Graph> smallest_graphs() {
  std::vector<Graph> graphs;
  for (std::int64_t n = 1; n <= 3; ++n)
    for (int edges = 0; edges < 1 << (n * (n - 1) / 2); ++edges) {
      Graph g{n, {}};
      int bit = 1;
      for (std::int64_t i = 0; i < n; ++i)
        for (std::int64_t j = i + 1; j < n; ++j, bit *= 2)
          if (edges & bit) g.edges.emplace_back(i, j);
      graphs.push_back(std::move(g));
    }
  return graphs;
}

Graph bordered_clique(std::int64_t width, std::int64_t gap, std::int64_t tail) {
  Graph g{width + gap + tail, {}};
  for (std::int64_t i = 0; i < width + gap; ++i) {
    const std::int64_t begin = i < width ? i + 1 : width + gap;
    for (std::int64_t j = begin; j < g.n; ++j)
      if (j < width || j >= width + gap) g.edges.emplace_back(i, j);
  }
  return g;
}

Problem crossed_counts(Random& random, std::int64_t a, std::int64_t b) {
  const std::int64_t n = 1 + a + b;
  std::vector<std::vector<double>> x(at(n), std::vector<double>(at(n), 0.0));
  const auto record = [&](std::int64_t i, std::int64_t j) {
    const std::int64_t c[] = {0, 1 + i, 1 + a + j};
    for (const std::int64_t r : c)
      for (const std::int64_t s : c) x[at(r)][at(s)] += 1.0;
  };
  for (std::int64_t i = 0; i < a; ++i) record(i, 0);
  for (std::int64_t j = 0; j < b; ++j) record(0, j);
  for (std::int64_t k = 0; k < 3 * (a + b); ++k) record(random.below(a), random.below(b));
  return problem_of(x);
}

}  // namespace sm::test
