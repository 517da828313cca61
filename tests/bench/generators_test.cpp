#include "bench/generators/generators.hpp"

#include <gtest/gtest.h>

#include <algorithm>
#include <cstdio>
#include <fstream>
#include <stdexcept>

#include "bench/generators/matrix_file.hpp"
#include "tests/bench/dense.hpp"

namespace sm::bench::test {
namespace {

std::vector<Problem> small_problems() {
  Ratings ratings{.students = 60, .lecturers = 42, .fewest = 4, .most = 9, .all_dummies = false};
  std::vector<Problem> problems;
  problems.push_back(plane_grid(7));
  problems.push_back(cube_grid(4));
  problems.push_back(squared_grid(7));
  problems.push_back(crossed_ratings(ratings));
  ratings.all_dummies = true;
  problems.push_back(crossed_ratings(ratings));
  problems.push_back(animal_model(300));
  problems.push_back(random_coefficients(9));
  problems.push_back(arrowhead(20));
  problems.push_back(crossed_factors(10, 30, 4));
  problems.push_back(path_with_hubs(40, 1));
  problems.push_back(path_with_hubs(40, 7));
  problems.push_back(hub_row(12));
  return problems;
}

TEST(Generators, entries_are_in_the_upper_triangle) {
  for (const Problem& p : small_problems()) {
    for (std::size_t k = 0; k < p.upper.size(); ++k) {
      ASSERT_TRUE(0 <= p.upper.row[k] && p.upper.row[k] <= p.upper.col[k] && p.upper.col[k] < p.n) << p.family;
    }
    EXPECT_EQ(p.rhs.size(), static_cast<std::size_t>(p.n)) << p.family;
  }
}

TEST(Generators, matrices_are_semidefinite_with_the_rank_that_they_state) {
  for (const Problem& p : small_problems()) {
    const Elimination left = eliminate(Dense(p), p.rhs);
    EXPECT_EQ(left.rank, p.rank) << p.family << " " << p.name;
    EXPECT_LE(left.rest, 1e-9) << p.family << " " << p.name;
  }
}

TEST(Generators, right_hand_sides_are_in_the_range) {
  for (const Problem& p : small_problems()) EXPECT_LE(eliminate(Dense(p), p.rhs).b_rest, 1e-9) << p.family << p.name;
}

TEST(Generators, the_squared_grid_is_the_square_of_the_grid) {
  const Dense grid(plane_grid(6));
  Dense want = grid * grid;
  for (int i = 0; i < 36; ++i) want(i, i) += 0.05;
  EXPECT_LE(largest_difference(Dense(squared_grid(6)), want), 1e-12);
}

TEST(Generators, a_name_stands_for_the_same_numbers_every_time) {
  const std::vector<Problem> one = small_problems(), two = small_problems();
  for (std::size_t k = 0; k < one.size(); ++k) {
    EXPECT_EQ(one[k].upper.row, two[k].upper.row);
    EXPECT_EQ(one[k].upper.col, two[k].upper.col);
    EXPECT_EQ(one[k].upper.value, two[k].upper.value);
    EXPECT_EQ(one[k].rhs, two[k].rhs);
  }
}

TEST(Generators, fixed_effects_of_subjects_touch_every_coefficient_and_subjects_do_not_meet) {
  const Dense a(random_coefficients(5));
  for (int i = 0; i < 10; ++i) {
    for (int j = 0; j < a.order(); ++j) EXPECT_NE(a(i, j), 0.0);
  }
  for (int i = 10; i < a.order(); ++i) {
    for (int j = 10; j < a.order(); ++j) EXPECT_EQ(a(i, j) == 0.0, (i - 10) / 6 != (j - 10) / 6) << i << ", " << j;
  }
}

TEST(Generators, insemination_bulls_have_many_offspring) {
  const Problem p = animal_model(12000);
  std::vector<int> entries(static_cast<std::size_t>(p.n));
  for (std::size_t k = 0; k < p.upper.size(); ++k) {
    if (p.upper.row[k] != p.upper.col[k]) ++entries[static_cast<std::size_t>(p.upper.row[k])];
  }
  const int fixed = 12 * 20;
  EXPECT_GT(*std::max_element(entries.begin() + fixed, entries.end()), 100);
}

TEST(MatrixFile, is_read_with_its_rank_and_refused_when_it_is_broken) {
  const std::string file = testing::TempDir() + "bench_matrix.mtx";
  const auto write = [&](const std::string& text) { std::ofstream(file) << text; };
  const std::string head = "%%MatrixMarket matrix coordinate real symmetric\n% a comment\n";
  write(head + "3 3 4\n1 1 1\n2 1 1\n2 2 1\n3 3 4\n");
  EXPECT_EQ(read_matrix(file).rank, 2);  // the second pivot is 0
  EXPECT_EQ(read_matrix(file).rhs, (std::vector<double>{2.0, 2.0, 4.0}));
  for (const std::string& broken : {head + "3 3 2\n1 1 1\n", head + "2 2 1\n3 1 1\n", head + "2 3 1\n1 1 1\n",
                                    std::string("%%MatrixMarket matrix coordinate real general\n1 1 1\n1 1 1\n")}) {
    write(broken);
    EXPECT_THROW((void)read_matrix(file), std::runtime_error) << broken;
  }
  std::remove(file.c_str());
}

TEST(Generators, shuffling_keeps_every_contribution) {
  Problem p = animal_model(300);
  const Dense before(p);
  const Triplets mixed = shuffled(p.upper);
  EXPECT_NE(mixed.row, p.upper.row);
  p.upper = mixed;
  EXPECT_LE(largest_difference(Dense(p), before), 1e-12);
}

}  // namespace
}  // namespace sm::bench::test
