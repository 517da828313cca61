#include "mixed/aliasing.hpp"

#include <gtest/gtest.h>

#include <Eigen/Dense>
#include <cmath>
#include <random>

#include "mixed/alias_roads.hpp"

namespace sm::mixed::test {
namespace {

using Matrix = Eigen::MatrixXd;

SparseColumns sparse(const Matrix& dense) {
  SparseColumns x;
  x.rows = dense.rows();
  for (Eigen::Index j = 0; j < dense.cols(); ++j) {
    for (Eigen::Index i = 0; i < dense.rows(); ++i) {
      if (dense(i, j) == 0.0) continue;
      x.row.push_back(i);
      x.value.push_back(dense(i, j));
    }
    x.start.push_back(static_cast<std::int64_t>(x.row.size()));
  }
  return x;
}

// The columns that add to the rank of those before them, each scaled to length 1.
std::vector<std::int64_t> independent_columns(Matrix dense) {
  std::vector<std::int64_t> kept;
  Eigen::Index rank = 0;
  for (Eigen::Index j = 0; j < dense.cols(); ++j) {
    if (dense.col(j).norm() > 0.0) dense.col(j).normalize();
    Eigen::ColPivHouseholderQR<Matrix> qr(dense.leftCols(j + 1));
    qr.setThreshold(1e-9);
    if (qr.rank() > rank) kept.push_back(j);
    rank = qr.rank();
  }
  return kept;
}

FixedDesign design_of(const Matrix& dense, const std::vector<std::int64_t>& term = {}) {
  FixedDesign design;
  design.x = sparse(dense);
  design.term = term.empty() ? std::vector<std::int64_t>(static_cast<std::size_t>(dense.cols()), 0) : term;
  return design;
}

void expect_dependence_holds(const Matrix& dense, const Dependences& found) {
  ASSERT_EQ(found.dependence.size(), found.aliased.size());
  for (std::size_t a = 0; a < found.aliased.size(); ++a) {
    ASSERT_EQ(found.dependence[a].size(), found.kept.size());
    Eigen::VectorXd left = dense.col(found.aliased[a]);
    for (std::size_t k = 0; k < found.kept.size(); ++k) left -= found.dependence[a][k] * dense.col(found.kept[k]);
    EXPECT_LE(left.norm(), 1e-9 * (1.0 + dense.col(found.aliased[a]).norm())) << "column " << found.aliased[a];
  }
}

void expect_both_roads_agree(const Matrix& dense, const std::vector<std::int64_t>& term,
                             const std::vector<double>& weights = {}) {
  const SparseColumns x = sparse(dense);
  const WeightedColumns columns(x, weights);
  const std::vector<std::int64_t> wanted = independent_columns(dense);
  for (Dependences found : {dense_dependences(columns), sparse_dependences(columns, term)}) {
    EXPECT_EQ(found.kept, wanted);
    EXPECT_EQ(found.kept.size() + found.aliased.size(), static_cast<std::size_t>(dense.cols()));
    expect_dependence_holds(dense, found);
    tidy(columns, found);
    expect_dependence_holds(dense, found);
  }
}

// An intercept, two crossed factors by all their dummies, a number, and the number within the first factor.
struct Crossed {
  Matrix x;
  std::vector<std::int64_t> term;
};
Crossed crossed(unsigned seed, Eigen::Index rows, Eigen::Index a, Eigen::Index b, double offset) {
  std::mt19937 random(seed);
  Crossed made{Matrix::Zero(rows, 1 + a + b + 1 + a), {}};
  for (Eigen::Index i = 0; i < rows; ++i) {
    const Eigen::Index level_a = static_cast<Eigen::Index>(random() % static_cast<unsigned>(a));
    const Eigen::Index level_b = static_cast<Eigen::Index>(random() % static_cast<unsigned>(b));
    const double number = offset + static_cast<double>(random() % 64) / 4.0;
    made.x(i, 0) = 1.0;
    made.x(i, 1 + level_a) = 1.0;
    made.x(i, 1 + a + level_b) = 1.0;
    made.x(i, 1 + a + b) = number;
    made.x(i, 2 + a + b + level_a) = number;
  }
  for (Eigen::Index j = 0; j < made.x.cols(); ++j) {
    made.term.push_back(j == 0 ? 0 : j <= a ? 1 : j <= a + b ? 2 : j == 1 + a + b ? 3 : 4);
  }
  return made;
}

TEST(Aliasing, keeps_years_and_their_squares_and_cubes_beside_an_intercept) {
  Matrix x(31, 4);
  for (Eigen::Index i = 0; i < 31; ++i) {
    const double year = 1990.0 + static_cast<double>(i);
    x.row(i) << 1.0, year, year * year, year * year * year;
  }
  FixedDesign design = design_of(x);
  find_aliased(design, {});
  EXPECT_EQ(design.rank(), 4);
  EXPECT_TRUE(design.aliased.empty());
  const Dependences found = sparse_dependences(WeightedColumns(design.x, {}), design.term);
  EXPECT_EQ(found.kept.size(), 4u);
}

TEST(Aliasing, sees_powers_of_years_in_those_of_years_less_a_constant) {
  Matrix x(31, 6);
  for (Eigen::Index i = 0; i < 31; ++i) {
    const double year = 1990.0 + static_cast<double>(i);
    const double t = year - 2000.0;
    x.row(i) << 1.0, year, year * year, year * year * year, t * t, t * t * t;
  }
  FixedDesign design = design_of(x);
  find_aliased(design, {});
  EXPECT_EQ(design.aliased, (std::vector<std::int64_t>{4, 5}));
  EXPECT_EQ(std::vector<double>(design.dependence.begin(), design.dependence.begin() + 4),
            (std::vector<double>{4e6, -4000.0, 1.0, 0.0}));
  Dependences found = sparse_dependences(WeightedColumns(design.x, {}), std::vector<std::int64_t>(6, 0));
  EXPECT_EQ(found.aliased, (std::vector<std::int64_t>{4, 5}));
}

TEST(Aliasing, allows_for_the_rounding_of_columns_that_nearly_cancel) {
  Matrix x(31, 5);
  for (Eigen::Index i = 0; i < 31; ++i) {
    const double t = 0.1 * static_cast<double>((i * 7) % 31);
    const double time = t + 300.7;
    x.row(i) << 1.0, time, time * time, time * time * time, t * t * t;
  }
  const SparseColumns columns = sparse(x);
  const WeightedColumns weighted(columns, {});
  for (const Dependences& found : {dense_dependences(weighted), sparse_dependences(weighted, {0, 1, 2, 3, 4})}) {
    EXPECT_EQ(found.aliased, (std::vector<std::int64_t>{4}));
  }
}

TEST(Aliasing, sees_sums_of_neighbours_wherever_they_stand) {
  for (Eigen::Index count = 3; count < 12; ++count) {
    for (Eigen::Index sum = 2; sum < count; ++sum) {
      std::mt19937 random(static_cast<unsigned>(100 * count + sum));
      std::normal_distribution<double> normal;
      Matrix x = Matrix::NullaryExpr(40, count, [&] { return normal(random); });
      x.col(sum) = x.col(sum - 1) - 3.0 * x.col(sum - 2);
      const SparseColumns columns = sparse(x);
      const Dependences found = dense_dependences(WeightedColumns(columns, {}));
      EXPECT_EQ(found.aliased, std::vector<std::int64_t>{sum}) << count;
      expect_dependence_holds(x, found);
    }
  }
}

TEST(Aliasing, keeps_powers_of_years_within_many_groups_and_sees_those_of_all_together) {
  constexpr Eigen::Index kGroups = 12;
  Matrix x = Matrix::Zero(31 * kGroups, 4 * kGroups + 4);
  std::vector<std::int64_t> term;
  for (Eigen::Index j = 0; j < x.cols(); ++j) term.push_back(j / kGroups);
  for (Eigen::Index i = 0; i < x.rows(); ++i) {
    const double year = 1990.0 + static_cast<double>(i / kGroups);
    double power = 1.0;
    for (Eigen::Index p = 0; p < 4; ++p, power *= year) {
      x(i, p * kGroups + i % kGroups) = power;
      x(i, 4 * kGroups + p) = power;
    }
  }
  const SparseColumns columns = sparse(x);
  for (Dependences found :
       {dense_dependences(WeightedColumns(columns, {})), sparse_dependences(WeightedColumns(columns, {}), term)}) {
    EXPECT_EQ(found.aliased, (std::vector<std::int64_t>{48, 49, 50, 51}));
    tidy(WeightedColumns(columns, {}), found);
    for (std::size_t k = 0; k < 48; ++k) EXPECT_EQ(found.dependence[2][k], k / kGroups == 2 ? 1.0 : 0.0) << k;
  }
}

TEST(Aliasing, allows_for_that_rounding_in_sums_over_many_groups) {
  constexpr Eigen::Index kGroups = 12;
  Matrix x = Matrix::Zero(31 * kGroups, 4 * kGroups + 1);
  std::vector<std::int64_t> term;
  for (Eigen::Index j = 0; j < x.cols(); ++j) term.push_back(j / kGroups);
  for (Eigen::Index i = 0; i < x.rows(); ++i) {
    const double t = 0.1 * static_cast<double>((i / kGroups * 7 + i) % 31);
    double power = 1.0;
    for (Eigen::Index p = 0; p < 4; ++p, power *= t + 300.7) x(i, p * kGroups + i % kGroups) = power;
    x(i, 4 * kGroups) = t * t * t;
  }
  const SparseColumns columns = sparse(x);
  for (const Dependences& found :
       {dense_dependences(WeightedColumns(columns, {})), sparse_dependences(WeightedColumns(columns, {}), term)}) {
    EXPECT_EQ(found.aliased, (std::vector<std::int64_t>{4 * kGroups}));
  }
}

TEST(Aliasing, names_the_last_of_a_dependent_set_with_small_fractions) {
  // The classes of age by their dummies, the first left out, beside age itself.
  Matrix x = Matrix::Zero(12, 5);
  for (Eigen::Index i = 0; i < 12; ++i) {
    const Eigen::Index level = i % 4;
    x(i, 0) = 1.0;
    x(i, 1) = 8.0 + 2.0 * static_cast<double>(level);
    if (level > 0) x(i, 1 + level) = 1.0;
  }
  FixedDesign design = design_of(x);
  find_aliased(design, {});
  EXPECT_EQ(design.aliased, (std::vector<std::int64_t>{4}));
  EXPECT_EQ(design.dependence, (std::vector<double>{-8.0 / 6.0, 1.0 / 6.0, -2.0 / 6.0, -4.0 / 6.0}));
}

TEST(Aliasing, counts_a_column_of_zeros_and_one_of_constants_beside_the_intercept) {
  Matrix x = Matrix::Zero(5, 4);
  x.col(0).setConstant(1.0);
  x.col(2).setConstant(2.5);
  x.col(3) << 1.0, 0.0, 0.0, 2.0, 3.0;
  for (const std::vector<double>& weights : {std::vector<double>{}, std::vector<double>{1.0, 4.0, 0.25, 9.0, 1e-6}}) {
    FixedDesign design = design_of(x);
    find_aliased(design, weights);
    EXPECT_EQ(design.kept, (std::vector<std::int64_t>{0, 3}));
    EXPECT_EQ(design.aliased, (std::vector<std::int64_t>{1, 2}));
    EXPECT_EQ(design.dependence, (std::vector<double>{0.0, 0.0, 2.5, 0.0}));
  }
}

TEST(Aliasing, tells_rounding_from_a_difference_that_is_meant) {
  for (const double difference : {1e-8, 1e-12}) {
    Matrix x(40, 3);
    for (Eigen::Index i = 0; i < 40; ++i) {
      x(i, 0) = 1.0;
      x(i, 1) = static_cast<double>((i * 7) % 11);
      x(i, 2) = 3.0 * x(i, 1) - 1.0 + difference * static_cast<double>((i * i) % 13) * 10.0;
    }
    const SparseColumns columns = sparse(x);
    const WeightedColumns weighted(columns, {});
    for (const Dependences& found : {dense_dependences(weighted), sparse_dependences(weighted, {0, 1, 2})}) {
      EXPECT_EQ(found.aliased.size(), difference > 1e-10 ? 0u : 1u);
    }
  }
}

TEST(Aliasing, agrees_with_dense_ranks_on_crossed_factors_and_numbers_within_them) {
  for (unsigned seed = 1; seed <= 12; ++seed) {
    SCOPED_TRACE(seed);
    const Crossed made = crossed(seed, 60 + 20 * (seed % 3), 3 + seed % 9, 2 + seed % 4, seed % 2 ? 0.0 : 1990.0);
    expect_both_roads_agree(made.x, made.term);
  }
}

TEST(Aliasing, agrees_with_dense_ranks_on_many_levels_in_few_rows_whatever_the_weights) {
  for (unsigned seed = 1; seed <= 6; ++seed) {
    SCOPED_TRACE(seed);
    const Crossed made = crossed(100 + seed, 40, 25, 12, 0.0);  // levels with one row, cells that hang together by one
    std::vector<double> weights;
    for (Eigen::Index i = 0; i < made.x.rows(); ++i) weights.push_back(static_cast<double>(1 + (i * i) % 17) / 8.0);
    expect_both_roads_agree(made.x, made.term);
    expect_both_roads_agree(made.x, made.term, weights);
  }
}

TEST(Aliasing, sees_through_combinations_of_several_columns_in_any_order) {
  std::mt19937 random(7);
  Matrix x(80, 9);
  for (Eigen::Index j : {0, 2, 3, 5, 6}) {
    for (Eigen::Index i = 0; i < x.rows(); ++i) x(i, j) = static_cast<double>(random() % 1024) / 64.0 - 3.0;
  }
  x.col(1) = 3.0 * x.col(0);
  x.col(4) = x.col(0) - 2.0 * x.col(2) + 0.5 * x.col(3);
  x.col(7) = x.col(5) - x.col(6) + x.col(4);
  x.col(8) = x.col(7) + x.col(1);
  expect_both_roads_agree(x, std::vector<std::int64_t>(9, 0));
  FixedDesign design = design_of(x);
  find_aliased(design, {});
  EXPECT_EQ(design.aliased, (std::vector<std::int64_t>{1, 4, 7, 8}));
  EXPECT_EQ(std::vector<double>(design.dependence.begin() + 5, design.dependence.begin() + 10),
            (std::vector<double>{1.0, -2.0, 0.5, 0.0, 0.0}));
}

TEST(Aliasing, finds_the_one_dependence_of_two_factors_of_a_thousand_levels) {
  // Rows (i, i) and (i, i + 1): one chain through all levels, written directly as sparse columns.
  constexpr std::int64_t kLevels = 1000;
  FixedDesign design;
  design.x.rows = 2 * kLevels - 1;
  const auto put = [&](std::initializer_list<std::int64_t> rows, std::int64_t term) {
    for (const std::int64_t row : rows) {
      if (row < 0 || row >= design.x.rows) continue;
      design.x.row.push_back(row);
      design.x.value.push_back(1.0);
    }
    design.x.start.push_back(static_cast<std::int64_t>(design.x.row.size()));
    design.term.push_back(term);
  };
  for (std::int64_t a = 0; a < kLevels; ++a) put({2 * a, 2 * a + 1}, 0);
  for (std::int64_t b = 0; b < kLevels; ++b) put({2 * b - 1, 2 * b}, 1);
  find_aliased(design, {});
  ASSERT_EQ(design.aliased, (std::vector<std::int64_t>{2 * kLevels - 1}));
  for (std::int64_t k = 0; k < 2 * kLevels - 1; ++k) {
    ASSERT_EQ(design.dependence[static_cast<std::size_t>(k)], k < kLevels ? 1.0 : -1.0) << k;
  }
}

}  // namespace
}  // namespace sm::mixed::test
