#include "bench/cases.hpp"

#include <array>

#include "bench/generators/generators.hpp"

namespace sm::bench {
namespace {

using Sizes = std::vector<int>;

// By size of the run: quick, moderate, full.
Sizes pick(Size size, const std::array<Sizes, 3>& sizes) { return sizes[static_cast<std::size_t>(size)]; }

std::vector<Ratings> ratings_of(Size size) {
  if (size == Size::quick) return {{.students = 150, .lecturers = 70, .fewest = 5, .most = 12}};
  std::vector<Ratings> all = {{.students = 2972, .lecturers = 1128, .fewest = 15, .most = 34}};
  if (size == Size::full) all.push_back({.students = 45000, .lecturers = 5000, .fewest = 10, .most = 20});
  return all;
}

}  // namespace

std::vector<Case> cases_of(Size size) {
  std::vector<Case> cases;
  const auto each = [&](const char* family, const std::array<Sizes, 3>& sizes, Problem (*make)(int),
                        const std::vector<std::string>& phases = {}) {
    for (const int n : pick(size, sizes)) cases.push_back({family, [make, n] { return make(n); }, phases});
  };
  each("a", {{{20, 40}, {100, 250, 500}, {100, 250, 500, 1000}}}, plane_grid);
  each("b", {{{6, 9}, {10, 20, 30}, {15, 30, 45, 60}}}, cube_grid);
  for (const bool all_dummies : {false, true}) {
    for (Ratings ratings : ratings_of(size)) {
      ratings.all_dummies = all_dummies;
      cases.push_back({"c", [ratings] { return crossed_ratings(ratings); }, {}});
    }
  }
  each("d", {{{1300}, {20000, 200000}, {20000, 200000, 1000000}}}, animal_model);
  each("e", {{{15, 30}, {50, 150, 300}, {100, 300, 700}}}, squared_grid);
  each("f", {{{150}, {1000, 5000}, {5000, 15000, 50000}}}, random_coefficients);
  each("arrow", {{{500}, {12500, 50000}, {12500, 50000}}}, arrowhead, {"ordering"});
  for (const int second : pick(size, {{{500}, {5000, 20000}, {5000, 20000}}})) {
    cases.push_back({"crossed", [second] { return crossed_factors(300, second, 10); }, {"ordering"}});
  }
  for (const int hubs : {1, 30, 1000}) {
    for (const int n : pick(size, {{{2000}, {10000, 100000}, {10000, 100000, 1000000}}})) {
      cases.push_back({"hubs", [n, hubs] { return path_with_hubs(n, hubs); }, {"ordering"}});
    }
  }
  each("row", {{{3000}, {300000}, {300000}}}, hub_row, {"assembly"});
  return cases;
}

std::vector<int> dense_orders(Size size) { return pick(size, {{{150}, {1000, 2000}, {2000, 4000}}}); }

}  // namespace sm::bench
