#include "mixed/relationship.hpp"

#include <gtest/gtest.h>

#include <Eigen/Core>
#include <cmath>

#include "mixed/eigenvalues.hpp"
#include "mixed/error.hpp"
#include "mixed/inbreeding.hpp"
#include "mixed/pedigrees.hpp"

namespace sm::mixed::test {
namespace {

using Eigen::MatrixXd;

MatrixXd dense(const Precision& precision) {
  MatrixXd m = MatrixXd::Zero(precision.order, precision.order);
  for (std::int64_t i = 0; i < precision.order; ++i) {
    const auto begin = static_cast<std::size_t>(precision.row_start[static_cast<std::size_t>(i)]);
    const auto end = static_cast<std::size_t>(precision.row_start[static_cast<std::size_t>(i) + 1]);
    EXPECT_EQ(precision.col[begin], i) << "the diagonal first";
    for (std::size_t p = begin; p < end; ++p) {
      EXPECT_TRUE(p == begin || precision.col[p - 1] < precision.col[p]);
      m(i, precision.col[p]) = m(precision.col[p], i) = precision.value[p];
    }
  }
  return m;
}

MatrixXd dense(const std::vector<double>& packed, std::int64_t n) {
  MatrixXd m(n, n);
  std::size_t p = 0;
  for (std::int64_t col = 0; col < n; ++col) {
    for (std::int64_t row = col; row < n; ++row) m(row, col) = m(col, row) = packed[p++];
  }
  EXPECT_EQ(p, packed.size());
  return m;
}

double log_determinant(const MatrixXd& m) { return eigenvalues_of(m).array().log().sum(); }

// The tabular method and the rules for the inverse share nothing: the one walks over all pairs, the other knows parents
// and the inbreeding that the sweeps found.
void expect_inverse(const Pedigree& p, double tolerance) {
  const MatrixXd a = dense(relationship_matrix(p), p.size());
  const std::vector<double> f = inbreeding(p);
  for (std::int64_t i = 0; i < p.size(); ++i) EXPECT_NEAR(f[static_cast<std::size_t>(i)], a(i, i) - 1.0, 1e-14);
  const Precision inverse = pedigree_precision(p, "p.csv");
  EXPECT_LT((a * dense(inverse) - MatrixXd::Identity(p.size(), p.size())).cwiseAbs().maxCoeff(), tolerance);
  EXPECT_NEAR(-inverse.log_det, log_determinant(a), tolerance * static_cast<double>(p.size()));
  EXPECT_EQ(inverse.inverse_diagonal_excess, f);
  EXPECT_EQ(inverse.nullity, 0);
}

// R. A. Mrode, Linear Models for the Prediction of Animal Breeding Values (CABI, 2nd ed. 2005), section 2.2 and 2.3.
TEST(Relationship, is_that_of_six_animals_in_a_textbook) {
  const Pedigree p = make_pedigree(rows_of("1 . .  2 . .  3 1 2  4 1 .  5 4 3  6 5 2"), "p.csv");
  const MatrixXd want{{1, 0, 0.5, 0.5, 0.5, 0.25},
                      {0, 1, 0.5, 0, 0.25, 0.625},
                      {0.5, 0.5, 1, 0.25, 0.625, 0.5625},
                      {0.5, 0, 0.25, 1, 0.625, 0.3125},
                      {0.5, 0.25, 0.625, 0.625, 1.125, 0.6875},
                      {0.25, 0.625, 0.5625, 0.3125, 0.6875, 1.125}};
  EXPECT_EQ(dense(relationship_matrix(p), 6), want);
  const std::vector<double> f = inbreeding(p);
  EXPECT_EQ(f, (std::vector<double>{0, 0, 0, 0, 0.125, 0.125}));
  EXPECT_EQ(mendelian_variances(p, f), (std::vector<double>{1, 1, 0.5, 0.75, 0.5, 0.46875}));
  const Precision inverse = pedigree_precision(p, "p.csv");
  EXPECT_EQ(inverse.col.size(), 16u);
  const MatrixXd got = dense(inverse);
  EXPECT_NEAR(got(0, 0), 1.0 + 0.5 + 1.0 / 3.0, 1e-15);
  EXPECT_NEAR(got(1, 5), -0.5 / 0.46875, 1e-15);
  EXPECT_EQ(got(0, 4), 0.0);
}

TEST(Relationship, and_its_inverse_are_inverse_to_each_other_with_inbreeding_and_rows_in_any_order) {
  for (std::uint64_t seed = 1; seed <= 30; ++seed) {
    RandomPedigree kind{.seed = seed, .founders = 2 + static_cast<int>(seed % 7), .animals = 90, .shuffled = true};
    kind.recent = seed % 2 == 0 ? 8 : 0;
    kind.unknown = seed % 3 == 0 ? 0 : 10;
    kind.rowless = seed % 5 == 0;
    expect_inverse(make_pedigree(random_rows(kind), "p.csv"), 1e-10);
  }
}

TEST(Relationship, and_its_inverse_are_inverse_to_each_other_with_selfing) {
  for (std::uint64_t seed = 1; seed <= 10; ++seed) {
    expect_inverse(make_pedigree(random_rows({.seed = seed, .animals = 80, .selfed = 40, .shuffled = true}), "p.csv"),
                   1e-10);
  }
}

// Two calves of a sire and his daughter add to the element of these two what she took from it.
TEST(Relationship, has_an_inverse_without_elements_that_cancel) {
  const Pedigree p = make_pedigree(rows_of("s . .  d . .  i s d  k s i  l s i"), "p.csv");
  const Precision inverse = pedigree_precision(p, "p.csv");
  EXPECT_EQ(dense(inverse)(0, 2), 0.0);
  EXPECT_EQ(inverse.col.size(), 11u);
  expect_inverse(p, 1e-14);
}

// More couples in one generation than go through the sweeps together, and couples that share sires, dams or both.
TEST(Relationship, has_the_inbreeding_of_large_generations) {
  std::string text;
  const auto name = [](int generation, int i) { return std::to_string(generation) + "_" + std::to_string(i); };
  for (int i = 0; i < 60; ++i) text += name(0, i) + " . . ";
  for (int g = 1; g < 6; ++g) {
    for (int i = 0; i < 60; ++i) {
      text += name(g, i) + " " + name(g - 1, (i * (g + 2)) % 37) + " " + name(g - 1, 37 + (i * 5) % 23) + " ";
    }
  }
  const Pedigree p = make_pedigree(rows_of(text), "p.csv");
  const MatrixXd a = dense(relationship_matrix(p), p.size());
  const std::vector<double> f = inbreeding(p);
  EXPECT_GT(a.diagonal().maxCoeff(), 1.1);
  for (std::int64_t i = 0; i < p.size(); ++i) EXPECT_NEAR(f[static_cast<std::size_t>(i)], a(i, i) - 1.0, 1e-14);
}

// With one pair of sibs as the parents of the next, F follows Wright's recurrence (S. Wright, Genetics 6 (1921) 124).
TEST(Relationship, has_the_inbreeding_of_repeated_full_sib_mating) {
  std::string text = "s0 . . d0 . . ";
  for (int g = 1; g <= 20; ++g) {
    const std::string parents = " s" + std::to_string(g - 1) + " d" + std::to_string(g - 1) + " ";
    text += "s" + std::to_string(g) + parents + "d" + std::to_string(g) + parents;
  }
  const std::vector<double> f = inbreeding(make_pedigree(rows_of(text), "p.csv"));
  double before = 0.0;
  double now = 0.0;
  for (std::size_t g = 2; g <= 20; ++g) {
    const double next = 0.25 * (1.0 + 2.0 * now + before);
    EXPECT_NEAR(f[2 * g], next, 1e-14) << g;
    EXPECT_NEAR(f[2 * g + 1], next, 1e-14) << g;
    before = std::exchange(now, next);
  }
}

TEST(Relationship, refuses_the_inverse_when_a_line_is_selfed_for_ever) {
  std::string text = "n0 . .";
  for (int g = 1; g <= 70; ++g) {
    const std::string parent = "n" + std::to_string(g - 1);
    text += " n" + std::to_string(g) + " " + parent + " " + parent;
  }
  const Pedigree p = make_pedigree(rows_of(text), "lines.csv");
  EXPECT_EQ(inbreeding(p)[10], 1.0 - std::pow(0.5, 10));
  try {
    pedigree_precision(p, "lines.csv");
    FAIL() << "a singular matrix was inverted";
  } catch (const ModelError& error) {
    EXPECT_NE(std::string(error.what()).find("lines.csv: 'n5"), std::string::npos) << error.what();
    EXPECT_NE(std::string(error.what()).find("; leave out the animal"), std::string::npos);
  }
}

}  // namespace
}  // namespace sm::mixed::test
