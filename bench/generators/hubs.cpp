#include <fmt/format.h>

#include <algorithm>

#include "bench/generators/generators.hpp"
#include "bench/generators/random.hpp"

namespace sm::bench {
namespace {

constexpr int kTouches = 3;  // hubs that a vertex of the path is tied to

Problem begin(const char* family, std::string name, int n) {
  Problem p{.family = family, .name = std::move(name), .n = n, .rank = n, .upper = {}, .rhs = {}};
  Random random(6);
  for (int i = 0; i < n; ++i) p.rhs.push_back(random.between(-1.0, 1.0));
  return p;
}

Problem star(const char* family, std::string name, int n) {
  Problem p = begin(family, std::move(name), n);
  p.upper.add(0, 0, n);
  for (int j = 1; j < n; ++j) p.upper.add(0, j, -1.0);
  for (int j = 1; j < n; ++j) p.upper.add(j, j, 2.0);
  return p;
}

}  // namespace

Problem arrowhead(int n) { return star("arrow", fmt::format("{}", n), n); }

Problem hub_row(int n) { return star("row", fmt::format("a row of {}", n), n); }

Problem path_with_hubs(int n, int hubs) {
  Problem p = begin("hubs", fmt::format("{} with {} hub{}", n, hubs, hubs == 1 ? "" : "s"), n + hubs);
  Random random(7);
  for (int h = 0; h < hubs; ++h) p.upper.add(h, h, 1.0);
  for (int i = 0; i < n; ++i) {
    const int vertex = hubs + i;
    p.upper.add(vertex, vertex, 3.0);
    if (i + 1 < n) p.upper.add(vertex, vertex + 1, -1.0);
    for (int t = 0; t < std::min(kTouches, hubs); ++t) {
      const int hub = random.below(hubs);
      p.upper.add(hub, hub, 0.1);
      p.upper.add(hub, vertex, -0.1);
    }
  }
  return p;
}

}  // namespace sm::bench
