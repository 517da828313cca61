#include "mixed/precision.hpp"

#include <gtest/gtest.h>

#include <Eigen/Core>
#include <cmath>
#include <random>

#include "mixed/eigenvalues.hpp"
#include "mixed/loaded_module.hpp"
#include "mixed/row_ids.hpp"

namespace sm::mixed::test {
namespace {

using Eigen::MatrixXd;
using Eigen::VectorXd;

class MatrixPrecision : public ::testing::Test {
 protected:
  static SparseColumns sparse(const MatrixXd& m) {
    SparseColumns k;
    k.rows = m.rows();
    for (Eigen::Index j = 0; j < m.cols(); ++j) {
      for (Eigen::Index i = 0; i < m.rows(); ++i) {
        if (m(i, j) == 0.0) continue;
        k.row.push_back(i);
        k.value.push_back(m(i, j));
      }
      k.start.push_back(static_cast<std::int64_t>(k.row.size()));
    }
    return k;
  }

  Precision precision(const MatrixXd& m) { return matrix_precision(module_.module(), sparse(m), names(m.rows())); }

  static MatrixNames names(Eigen::Index rows) { return {"k.mtx", row_ids({}, rows, "")}; }

  template <class Error = NotSemidefinite>
  std::string refusal(const MatrixXd& m) {
    try {
      precision(m);
    } catch (const Error& error) {
      return error.what();
    }
    ADD_FAILURE() << "taken:\n" << m;
    return {};
  }

  // Rank, determinant and null space against the eigenvalues.
  void expect_as_eigenvalues_say(const MatrixXd& m, std::int64_t nullity) {
    const Precision k = precision(m);
    const Eigen::Index n = m.rows();
    const VectorXd values = eigenvalues_of(m);
    EXPECT_LT(values.head(nullity).cwiseAbs().sum(), 1e-10);
    ASSERT_EQ(k.nullity, nullity);
    ASSERT_EQ(k.order, n);
    EXPECT_NEAR(k.log_det, values.tail(n - nullity).array().log().sum(), 1e-8 * static_cast<double>(n));
    const MatrixXd basis = Eigen::Map<const MatrixXd>(k.null_basis.data(), n, nullity);
    if (nullity > 0) {
      EXPECT_LT((m * basis).cwiseAbs().maxCoeff(), 1e-10 * m.cwiseAbs().maxCoeff());
      EXPECT_LT((basis.transpose() * basis - MatrixXd::Identity(nullity, nullity)).cwiseAbs().maxCoeff(), 1e-13);
      EXPECT_TRUE(std::is_sorted(k.null_rows.begin(), k.null_rows.end()));
    }
    MatrixXd kept(n - nullity, n - nullity);
    for (Eigen::Index i = 0, a = 0; i < n; ++i) {
      if (std::count(k.null_rows.begin(), k.null_rows.end(), i) > 0) continue;
      for (Eigen::Index j = 0, b = 0; j < n; ++j) {
        if (std::count(k.null_rows.begin(), k.null_rows.end(), j) == 0) kept(a, b++) = m(i, j);
      }
      ++a;
    }
    EXPECT_GT(eigenvalues_of(kept).minCoeff(), 1e-9);
    EXPECT_TRUE(k.inverse_diagonal_excess.empty());
  }

 private:
  LoadedModule module_;
};

// D - W of a random graph on `n` points whose edges stay within `parts` parts; weights from 0.5 to 2.
MatrixXd graph_laplacian(int n, int parts, std::uint64_t seed) {
  std::mt19937_64 random(seed);
  MatrixXd m = MatrixXd::Zero(n, n);
  const auto join = [&](int i, int j) {
    const double weight = 0.5 + static_cast<double>(random() % 16) / 10.0;
    m(i, i) += weight;
    m(j, j) += weight;
    m(i, j) -= weight;
    m(j, i) -= weight;
  };
  for (int i = parts; i < n; ++i) join(i, i - parts);  // the points of a part are those of one remainder
  for (int edge = 0; edge < 2 * n; ++edge) {
    const int i = static_cast<int>(random() % static_cast<std::uint64_t>(n));
    const int j = (i + parts * static_cast<int>(1 + random() % 5)) % n;
    if (i != j && i % parts == j % parts) join(i, j);
  }
  return m;
}

TEST_F(MatrixPrecision, that_is_regular_has_no_null_space) {
  for (int n : {1, 2, 7, 40}) {
    MatrixXd m = graph_laplacian(n, 1, 11);
    m.diagonal().array() += 0.25;
    expect_as_eigenvalues_say(m, 0);
  }
}

// The least eigenvalue is that of the mean, and far above what rounding makes of a null one.
TEST_F(MatrixPrecision, with_a_tiny_eigenvalue_is_not_taken_for_singular) {
  for (const double tiny : {1e-2, 1e-4, 1e-6, 1e-7}) {
    for (std::uint64_t seed = 1; seed <= 3; ++seed) {
      MatrixXd m = graph_laplacian(30, 1, seed);
      m.diagonal().array() += tiny;
      const Precision k = precision(m);
      EXPECT_EQ(k.nullity, 0) << tiny;
      EXPECT_TRUE(k.null_rows.empty()) << tiny;
      const Eigen::VectorXd values = eigenvalues_of(m);
      ASSERT_NEAR(values.minCoeff() / tiny, 1.0, 1e-6);
      EXPECT_NEAR(k.log_det, values.array().log().sum(), 1e-6) << tiny;
    }
  }
}

TEST_F(MatrixPrecision, of_a_connected_graph_leaves_the_mean_open) {
  for (std::uint64_t seed = 1; seed <= 5; ++seed) {
    expect_as_eigenvalues_say(graph_laplacian(30 + static_cast<int>(seed), 1, seed), 1);
  }
}

TEST_F(MatrixPrecision, of_a_graph_in_parts_leaves_the_mean_of_each_open) {
  for (const int parts : {2, 3, 7}) expect_as_eigenvalues_say(graph_laplacian(60, parts, 3), parts);
}

TEST_F(MatrixPrecision, of_isolated_points_has_them_in_the_null_space) {
  MatrixXd m = MatrixXd::Zero(12, 12);
  m.topLeftCorner(9, 9) = graph_laplacian(9, 1, 5);
  expect_as_eigenvalues_say(m, 4);
}

// Its null vectors, a constant and a line, overlap; those of the parts above do not.
TEST_F(MatrixPrecision, of_a_second_order_walk_leaves_level_and_slope_open) {
  const int n = 25;
  MatrixXd differences = MatrixXd::Zero(n - 2, n);
  for (int i = 0; i + 2 < n; ++i) differences.row(i).segment(i, 3) << 1.0, -2.0, 1.0;
  expect_as_eigenvalues_say(differences.transpose() * differences, 2);
}

TEST_F(MatrixPrecision, of_low_rank_has_a_large_null_space) {
  std::mt19937_64 random(9);
  MatrixXd z(14, 5);
  for (double& value : z.reshaped()) value = static_cast<double>(random() % 2001) / 1000.0 - 1.0;
  expect_as_eigenvalues_say(z * z.transpose(), 9);
}

TEST_F(MatrixPrecision, has_the_upper_triangle_by_rows_with_the_diagonal_first) {
  MatrixXd m(3, 3);
  m << 2, 0, -1, 0, 3, 0, -1, 0, 1;
  const Precision k = precision(m);
  EXPECT_EQ(k.row_start, (std::vector<std::int64_t>{0, 2, 3, 4}));
  EXPECT_EQ(k.col, (std::vector<std::int64_t>{0, 2, 1, 2}));
  EXPECT_EQ(k.value, (std::vector<double>{2, -1, 3, 1}));
}

TEST_F(MatrixPrecision, that_is_indefinite_is_refused) {
  MatrixXd m = MatrixXd::Identity(3, 3);
  m(1, 1) = -2.0;
  EXPECT_EQ(refusal(m),
            "k.mtx: row 2 (2) has -2 on the diagonal, expected a positive semidefinite matrix; give the inverse of a "
            "covariance matrix, with all digits (17)");
  m(1, 1) = 1.0;
  m(0, 1) = m(1, 0) = 5.0;
  EXPECT_NE(refusal(m).find("k.mtx: the matrix has a negative eigenvalue, expected"), std::string::npos);
}

// So little that the factor drops the pivots without a word.
TEST_F(MatrixPrecision, that_is_indefinite_by_a_little_is_refused) {
  MatrixXd m = graph_laplacian(10, 1, 2);
  m(4, 4) -= 1e-3;
  EXPECT_NE(refusal(m).find(") has the pivot -"), std::string::npos);
  const MatrixXd small = 1e-6 * m;
  EXPECT_NE(refusal(small).find(") has the pivot -"), std::string::npos);
  MatrixXd zeros = MatrixXd::Identity(4, 4);
  zeros(2, 2) = zeros(3, 3) = 0.0;
  zeros(2, 3) = zeros(3, 2) = 0.01;
  EXPECT_NE(refusal(zeros).find("are left with pivots of 0, but 0.01 between them"), std::string::npos);
}

TEST_F(MatrixPrecision, that_is_no_symmetric_square_or_zero_is_refused) {
  EXPECT_EQ(refusal<ModelError>(MatrixXd::Ones(2, 3)),
            "k.mtx: found 2 rows and 3 columns, expected a square matrix with a row for each level; give the precision "
            "matrix of the levels");
  MatrixXd m = MatrixXd::Identity(3, 3);
  m(2, 0) = 0.5;
  EXPECT_NE(refusal<ModelError>(m).find("found 0.5 at (3, 1) and 0 at (1, 3), expected a symmetric matrix"),
            std::string::npos);
  EXPECT_NE(refusal<ModelError>(MatrixXd::Zero(3, 3)).find("k.mtx: the matrix is zero"), std::string::npos);
}

}  // namespace
}  // namespace sm::mixed::test
