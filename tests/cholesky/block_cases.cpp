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

Graph growing_tails(Random& random, std::int64_t count, std::int64_t most_width, std::int64_t border) {
  Indices first{0};
  for (std::int64_t c = 0; c < count; ++c) first.push_back(first.back() + 1 + random.below(most_width));
  const std::int64_t begin = first.back();
  Graph g{begin + border, {}};
  for (std::size_t c = 0; c < at(count); ++c) {
    for (std::int64_t i = first[c]; i < first[c + 1]; ++i)
      for (std::int64_t j = i + 1; j < first[c + 1]; ++j) g.edges.emplace_back(i, j);
    for (const std::size_t next : {c + 1, c + 2}) {
      if (next >= at(count) || !random.chance(next == c + 1 ? 80 : 30)) continue;
      g.edges.emplace_back(first[c], first[next] + random.below(first[next + 1] - first[next]));
    }
    const std::int64_t share = c == 0 || random.chance(15) ? 50 + random.below(51) : 3;
    for (std::int64_t j = begin; j < g.n; ++j)
      if (random.chance(share)) g.edges.emplace_back(first[c + 1] - 1, j);
  }
  for (std::int64_t i = begin; i < g.n; ++i)
    for (std::int64_t j = i + 1; j < g.n; ++j) g.edges.emplace_back(i, j);
  return relabelled(g, natural_order(g.n));  // sorted
}

Graph subjects(const std::vector<Indices>& tails, std::int64_t width, std::int64_t border) {
  const auto own = static_cast<std::int64_t>(tails.size()) * width;
  Graph g{own + border, {}};
  for (std::size_t s = 0; s < tails.size(); ++s) {
    const std::int64_t first = static_cast<std::int64_t>(s) * width;
    for (std::int64_t i = first; i < first + width; ++i) {
      for (std::int64_t j = i + 1; j < first + width; ++j) g.edges.emplace_back(i, j);
      for (const std::int64_t b : tails[s]) g.edges.emplace_back(i, own + b);
    }
  }
  return g;
}

std::vector<Indices> whole_tails(std::int64_t count, std::int64_t border) {
  return std::vector<Indices>(at(count), natural_order(border));
}

std::vector<Indices> mixed_tails(Random& random, std::int64_t count, std::int64_t border) {
  std::vector<Indices> parts(3);
  for (Indices& part : parts) {
    const std::int64_t share = 20 + random.below(81);
    for (std::int64_t b = 0; b < border; ++b)
      if (random.chance(share)) part.push_back(b);
  }
  std::vector<Indices> tails;
  for (std::int64_t s = 0; s < count; ++s) tails.push_back(parts[at(random.below(3))]);
  return tails;
}

Graph mixed_subjects(Random& random, std::int64_t most, std::int64_t most_border) {
  const std::int64_t border = 1 + random.below(most_border);
  const std::vector<Indices> tails = mixed_tails(random, 1 + random.below(most), border);
  return subjects(tails, 1 + random.below(9), border);
}

Twins twin_subjects(Random& random, std::int64_t count, std::int64_t width, std::int64_t border) {
  const std::int64_t own = count * width;
  const std::int64_t n = own + border;
  std::vector<std::vector<double>> x(at(n), std::vector<double>(at(n), 0.0));
  std::int64_t rank = border;
  for (std::int64_t first = 0; first < own; first += width) {
    std::vector<std::int64_t> kind(at(width), 0);  // which unit vector a coefficient holds besides the common part
    for (std::int64_t i = 1; i < width; ++i) kind[at(i)] = kind[at(i - 1)] + (random.chance(40) ? 0 : 1);
    rank += kind.back() + 1;
    for (std::int64_t i = 0; i < width; ++i) {
      for (std::int64_t j = 0; j < width; ++j)
        x[at(first + i)][at(first + j)] = 1.0 + (kind[at(i)] == kind[at(j)] ? 4.0 : 0.0);
      for (std::int64_t b = 0; b < border; ++b)
        x[at(first + i)][at(own + b)] = x[at(own + b)][at(first + i)] = 0.125 * static_cast<double>(b + 1);
    }
  }
  for (std::int64_t b = 0; b < border; ++b) x[at(own + b)][at(own + b)] = 64.0 * static_cast<double>(n);
  return {problem_of(x), rank};
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
