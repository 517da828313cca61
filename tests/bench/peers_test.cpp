#include <gtest/gtest.h>

#include <algorithm>
#include <cmath>
#include <numeric>

#include "bench/generators/generators.hpp"
#include "bench/peers/cholmod.hpp"
#include "bench/peers/eigen.hpp"
#include "bench/peers/lapack.hpp"
#include "bench/peers/maps.hpp"
#include "bench/peers/orderings.hpp"
#include "bench/peers/pivots.hpp"
#include "bench/peers/takahashi.hpp"
#include "tests/bench/dense.hpp"

namespace sm::bench::test {
namespace {

std::vector<int> natural(int n) {
  std::vector<int> order(static_cast<std::size_t>(n));
  std::iota(order.begin(), order.end(), 0);
  return order;
}

Problem path_of(int n) {
  Problem p{.family = "path", .name = "", .n = n, .rank = n, .upper = {}, .rhs = {}};
  for (int i = 0; i < n; ++i) p.upper.add(i, i, 4.0);
  for (int i = 1; i < n; ++i) p.upper.add(i - 1, i, -1.0);
  return p;
}

TEST(Peers, column_takahashi_gives_the_diagonal_of_the_inverse_and_traces) {
  for (const Problem& p : {plane_grid(8), random_coefficients(6), animal_model(200)}) {
    const UpperRows rows = compress(p);
    const Dense want = inverse(Dense(p));
    for (const Kind kind : {Kind::simplicial, Kind::supernodal}) {
      Cholmod cholmod(rows, Ordering::amd, kind);
      cholmod.analyse();
      ASSERT_TRUE(cholmod.factorize());
      if (kind == Kind::supernodal) cholmod.make_simplicial();
      Takahashi takahashi(cholmod);
      takahashi.run();
      const std::vector<double> diagonal = takahashi.diagonal();
      for (int i = 0; i < p.n; ++i) EXPECT_NEAR(diagonal[static_cast<std::size_t>(i)], want(i, i), 1e-10);
      const std::vector<double> z = takahashi.on_pattern(rows);
      for (int i = 0; i < p.n; ++i) {
        for (auto q = static_cast<std::size_t>(rows.start[static_cast<std::size_t>(i)]);
             q < static_cast<std::size_t>(rows.start[static_cast<std::size_t>(i) + 1]); ++q) {
          EXPECT_NEAR(z[q], want(i, rows.col[q]), 1e-10);
        }
      }
      EXPECT_NEAR(takahashi.trace_with(rows), p.n, 1e-9 * p.n);
    }
  }
}

TEST(Peers, cholmod_gives_determinants_and_solutions_in_both_forms_and_after_refilling) {
  const Problem p = animal_model(250);
  const UpperRows rows = compress(p);
  const double want = eliminate(Dense(p), p.rhs).log_determinant;
  std::vector<double> doubled = rows.value;
  for (double& v : doubled) v *= 2.0;
  for (const Ordering ordering : {Ordering::amd, Ordering::metis}) {
    for (const Kind kind : {Kind::simplicial, Kind::supernodal}) {
      Cholmod cholmod(rows, ordering, kind);
      cholmod.analyse();
      ASSERT_TRUE(cholmod.factorize());
      EXPECT_NEAR(cholmod.log_determinant(), want, 1e-9 * std::fabs(want));
      EXPECT_EQ(solution_fault(rows, cholmod.solve(p.rhs.data(), 1), p.rhs), "");
      cholmod.refill(doubled);
      ASSERT_TRUE(cholmod.factorize());
      EXPECT_NEAR(cholmod.log_determinant(), want + p.n * std::log(2.0), 1e-8 * p.n);
    }
  }
}

TEST(Peers, a_given_permutation_has_the_fill_of_the_dense_elimination) {
  const Problem p = arrowhead(30);
  EXPECT_EQ(fill_of(compress(p), natural(30)).entries, 30.0 * 31.0 / 2.0);  // the hub first fills everything
  std::vector<int> last = natural(30);
  std::reverse(last.begin(), last.end());
  EXPECT_EQ(fill_of(compress(p), last).entries, 59.0);  // the hub last fills nothing
}

TEST(Peers, orderings_are_permutations) {
  const UpperRows rows = compress(animal_model(500));
  std::vector<int> order;
  order_by_amd(rows, order);
  EXPECT_EQ(permutation_fault(order, rows.n), "");
  Graph graph(rows);
  order_by_metis(graph, order);
  EXPECT_EQ(permutation_fault(order, rows.n), "");
  order[3] = order[4];
  EXPECT_NE(permutation_fault(order, rows.n), "");
}

TEST(Peers, maps_and_compressing_give_the_same_rows) {
  const Problem p = animal_model(300);
  MapAssembly maps(p.n);
  maps.enter(p.upper);
  UpperRows rows;
  maps.close(rows);
  EXPECT_EQ(rows_fault(rows, compress(p)), "");
  const Dense dense(p);
  for (int i = 0; i < p.n; ++i) {
    for (int q = rows.start[static_cast<std::size_t>(i)]; q < rows.start[static_cast<std::size_t>(i) + 1]; ++q) {
      EXPECT_NEAR(rows.value[static_cast<std::size_t>(q)], dense(i, rows.col[static_cast<std::size_t>(q)]), 1e-12);
    }
  }
  rows.value[5] += 1e-6;
  EXPECT_NE(rows_fault(rows, compress(p)), "");
}

TEST(Peers, eigen_solves_multiplies_and_iterates) {
  const Problem p = squared_grid(9);
  const UpperRows rows = compress(p);
  std::vector<double> x, y;
  ASSERT_TRUE(solve_by_eigen(rows, p.rhs, x));
  EXPECT_EQ(solution_fault(rows, x.data(), p.rhs), "");
  multiply_by_eigen(rows, x, y, 1);
  for (std::size_t i = 0; i < y.size(); ++i) EXPECT_NEAR(y[i], p.rhs[i], 1e-10);
  EXPECT_GT(iterate_by_eigen(rows, p.rhs, y, 400), 0.0);
  for (std::size_t i = 0; i < y.size(); ++i) EXPECT_NEAR(y[i], x[i], 1e-8);
}

TEST(Peers, pivot_margins_count_the_rank_and_keep_the_two_kinds_apart) {
  const Ratings ratings{.students = 60, .lecturers = 42, .fewest = 4, .most = 9, .all_dummies = true};
  const Problem p = crossed_ratings(ratings);
  const UpperRows rows = compress(p);
  const PivotMargins margins = pivot_margins(rows, natural(p.n), 1e-12);
  EXPECT_EQ(margins.accepted, p.rank);
  EXPECT_LT(margins.largest_dropped, 1.0);
  EXPECT_GT(margins.smallest_accepted, 1.0);
  // Of a tridiagonal matrix in its own order the pivots are known: 4 - 1 / the one before.
  const Problem path = path_of(20);
  const PivotMargins all = pivot_margins(compress(path), natural(20), 1e-12);
  double pivot = 4.0;
  for (int k = 1; k < 20; ++k) pivot = 4.0 - 1.0 / pivot;
  EXPECT_EQ(all.accepted, 20);
  EXPECT_NEAR(all.smallest_accepted, pivot / 4.0 / 1e-12, 1e-3 * all.smallest_accepted);
}

TEST(Peers, dense_factors_agree_and_invert) {
  const Dense a(plane_grid(5));
  std::vector<double> full, packed;
  for (int j = 0; j < 25; ++j) {
    for (int i = 0; i < 25; ++i) full.push_back(a(i, j));
    for (int i = 0; i <= j; ++i) packed.push_back(a(i, j));
  }
  ASSERT_TRUE(factor_full(full, 25) && factor_packed(packed, 25));
  for (std::size_t j = 0; j < 25; ++j) {
    for (std::size_t i = 0; i <= j; ++i) EXPECT_NEAR(full[25 * j + i], packed[j * (j + 1) / 2 + i], 1e-12);
  }
  ASSERT_TRUE(invert_full(full, 25));
  EXPECT_NEAR(full[25 * 24], inverse(a)(0, 24), 1e-12);
}

}  // namespace
}  // namespace sm::bench::test
