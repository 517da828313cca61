#include "cholesky/hub_graphs.hpp"

#include <algorithm>

namespace sm::test {

namespace {

using Vertex = std::int64_t;

void link(Graph& graph, Vertex a, Vertex b) {
  if (a != b) graph.edges.emplace_back(std::min(a, b), std::max(a, b));
}

void link_all(Graph& graph, const std::vector<Vertex>& effects) {
  for (std::size_t a = 0; a < effects.size(); ++a)
    for (std::size_t b = a + 1; b < effects.size(); ++b) link(graph, effects[a], effects[b]);
}

Graph tidied(Graph graph) {
  std::sort(graph.edges.begin(), graph.edges.end());
  graph.edges.erase(std::unique(graph.edges.begin(), graph.edges.end()), graph.edges.end());
  return graph;
}

}  // namespace

Graph crossed(Random& random, std::int64_t few, std::int64_t many, std::int64_t records) {
  Graph graph{few + many + 1, {}};
  for (std::int64_t j = 0; j < many; ++j)
    for (std::int64_t r = 0; r < records; ++r) link_all(graph, {random.below(few), few + j, few + many});
  return tidied(std::move(graph));
}

Graph pedigree(Random& random, std::int64_t animals, std::int64_t groups) {
  Graph graph{animals + groups, {}};
  for (std::int64_t i = 1; i < animals; ++i) {
    const Vertex sire = random.below(1 + i / 20);
    const Vertex dam = random.below(i);
    if (random.chance(90)) link_all(graph, {sire, dam, i});
    if (random.chance(60)) link(graph, i, animals + i * groups / animals);
  }
  return tidied(std::move(graph));
}

Graph mixed_model(Random& random, std::int64_t subjects, std::int64_t items, std::int64_t records) {
  const Vertex mean = subjects + items;
  Graph graph{mean + 1 + 9, {}};
  for (std::int64_t s = 0; s < subjects; ++s)
    for (std::int64_t r = 0; r < records; ++r)
      link_all(graph, {s, subjects + std::min(random.below(items), random.below(items)), mean, mean + 1 + s % 2,
                       mean + 3 + random.below(4), mean + 7 + random.below(3)});
  return tidied(std::move(graph));
}

Graph with_hubs(Random& random, const Graph& graph, std::int64_t hubs, std::int64_t percent) {
  Graph more{graph.n + hubs, graph.edges};
  for (std::int64_t h = graph.n; h < more.n; ++h)
    for (std::int64_t v = 0; v < graph.n; ++v)
      if (random.chance(percent)) link(more, v, h);
  const bool linked = random.chance(50);
  for (std::int64_t h = graph.n; linked && h < more.n; ++h)
    for (std::int64_t other = graph.n; other < h; ++other) link(more, other, h);
  return tidied(std::move(more));
}

Graph wheel(std::int64_t n) {
  Graph graph{n, {}};
  for (std::int64_t i = 1; i < n; ++i) {
    link(graph, 0, i);
    if (i + 1 < n) link(graph, i, i + 1);
  }
  return tidied(std::move(graph));
}

Graph chained(Random& random, std::int64_t chains, std::int64_t length) {
  Graph graph{chains * length + 1, {}};
  for (std::int64_t c = 0; c < chains; ++c) {
    const Vertex first = c * length;
    const Vertex last = first + length - 1;
    link(graph, first, graph.n - 1);
    for (Vertex v = first; v < last; ++v) link(graph, v, v + 1);
    if (random.chance(50)) link(graph, first, last);
    if (c > 0 && random.chance(30)) link(graph, first - 1, last);
  }
  return tidied(std::move(graph));
}

Graph brick(std::int64_t width, std::int64_t height, std::int64_t depth) {
  Graph graph{width * height * depth, {}};
  for (std::int64_t v = 0; v < graph.n; ++v) {
    if ((v + 1) % width != 0) link(graph, v, v + 1);
    if (v / width % height + 1 < height) link(graph, v, v + width);
    if (v + width * height < graph.n) link(graph, v, v + width * height);
  }
  return tidied(std::move(graph));
}

Graph any_hub_graph(Random& random, std::int64_t size) {
  const std::int64_t n = 2 + random.below(size);
  switch (random.below(7)) {
    case 0:
      return crossed(random, 1 + random.below(20), n, 1 + random.below(6));
    case 1:
      return pedigree(random, n, 1 + random.below(6));
    case 2:
      return mixed_model(random, n / 2 + 1, n / 4 + 1, 1 + random.below(8));
    case 3:
      return wheel(n);
    case 4:
      return chained(random, 1 + n / 5, 1 + random.below(6));
    case 5:
      return arrowhead(n, 1 + random.below(std::min<std::int64_t>(n, 6)));
    default:
      return with_hubs(random, any_graph(random, size), 1 + random.below(30), random.below(101));
  }
}

}  // namespace sm::test
