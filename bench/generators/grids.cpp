#include <fmt/format.h>

#include "bench/generators/generators.hpp"
#include "bench/generators/random.hpp"

namespace sm::bench {
namespace {

Problem begin(const char* family, std::string name, int n) {
  Problem p{.family = family, .name = std::move(name), .n = n, .rank = n, .upper = {}, .rhs = {}};
  Random random(1);
  p.rhs.reserve(static_cast<std::size_t>(n));
  for (int i = 0; i < n; ++i) p.rhs.push_back(random.between(-1.0, 1.0));
  return p;
}

}  // namespace

Problem plane_grid(int k) {
  Problem p = begin("a", fmt::format("{0} x {0}", k), k * k);
  for (int y = 0; y < k; ++y) {
    for (int x = 0; x < k; ++x) {
      const int i = y * k + x;
      p.upper.add(i, i, 4.0);
      if (x + 1 < k) p.upper.add(i, i + 1, -1.0);
      if (y + 1 < k) p.upper.add(i, i + k, -1.0);
    }
  }
  return p;
}

Problem cube_grid(int k) {
  Problem p = begin("b", fmt::format("{0} x {0} x {0}", k), k * k * k);
  for (int z = 0; z < k; ++z) {
    for (int y = 0; y < k; ++y) {
      for (int x = 0; x < k; ++x) {
        const int i = (z * k + y) * k + x;
        p.upper.add(i, i, 6.0);
        if (x + 1 < k) p.upper.add(i, i + 1, -1.0);
        if (y + 1 < k) p.upper.add(i, i + k, -1.0);
        if (z + 1 < k) p.upper.add(i, i + k * k, -1.0);
      }
    }
  }
  return p;
}

Problem squared_grid(int k) {
  Problem p = begin("e", fmt::format("{0} x {0}", k), k * k);
  const auto inside = [k](int x, int y) { return x >= 0 && x < k && y >= 0 && y < k; };
  for (int y = 0; y < k; ++y) {
    for (int x = 0; x < k; ++x) {
      const int i = y * k + x;
      const int neighbours = inside(x - 1, y) + inside(x + 1, y) + inside(x, y - 1) + inside(x, y + 1);
      p.upper.add(i, i, 16.0 + neighbours + 0.05);
      // (L L)[i, j] for j after i: one edge carries 2 * 4 * -1, two steps on one line 1, round a corner 1 + 1.
      if (inside(x + 1, y)) p.upper.add(i, i + 1, -8.0);
      if (inside(x + 2, y)) p.upper.add(i, i + 2, 1.0);
      if (inside(x - 1, y + 1)) p.upper.add(i, i + k - 1, 2.0);
      if (inside(x, y + 1)) p.upper.add(i, i + k, -8.0);
      if (inside(x + 1, y + 1)) p.upper.add(i, i + k + 1, 2.0);
      if (inside(x, y + 2)) p.upper.add(i, i + 2 * k, 1.0);
    }
  }
  return p;
}

}  // namespace sm::bench
