// From assembly to solution over random structures: what must hold whatever the matrix.
#include <algorithm>
#include <cmath>

#include "cholesky/cholesky_support.hpp"

namespace sm::test {
namespace {

constexpr std::int32_t kFormats[] = {SM_FORMAT_COLUMNS, SM_FORMAT_ROWS};

class PropertiesTest : public ModuleTest {
 protected:
  double tolerance() { return instance()->tolerances[2]; }
  void destroy(SmMatrix* m) { EXPECT_EQ(fn().qxsmDestroyMatrix(instance(), &m), SM_OK); }
  // Entered in any order and in two parts that are added up.
  SmMatrix* assembled(const Problem& problem, Random& random) {
    SmMatrix* m = nullptr;
    EXPECT_EQ(fn().qxsmnewss(instance(), &m, problem.n), SM_OK);
    for (const std::int64_t k : random.permutation(static_cast<std::int64_t>(problem.upper.size()))) {
      const Entry& e = problem.upper[at(k)];
      const double part = random.dyadic();
      EXPECT_EQ(fn().qxsmassign(m, e.row, e.col, 1, part), SM_OK);
      EXPECT_EQ(fn().qxsmassign(m, e.row, e.col, 1, e.value - part), SM_OK);
    }
    EXPECT_EQ(fn().qxsmclose(m, 0.0), SM_OK);
    return m;
  }
  void check_sparse(SmMatrix* m, const Problem& problem, std::int64_t rank, Random& random);
  void check_packed(const Problem& problem, std::int64_t rank, std::int32_t format, Random& random);
};
INSTANTIATE_BOTH_HOSTS(PropertiesTest);

void PropertiesTest::check_sparse(SmMatrix* m, const Problem& problem, std::int64_t rank, Random& random) {
  const std::int64_t n = problem.n;
  const Dense a = problem.dense();
  ASSERT_EQ(fn().qxsmfact(m, 0), SM_OK);
  EXPECT_EQ(m->rank, rank);
  EXPECT_EQ(rank, rank_by_full_pivoting(a));
  const Dense u = stored_u(m);
  Dense d(n, n);
  std::vector<bool> accepted(at(n));
  long double log_det = 0.0L;
  for (std::int64_t k = 0; k < n; ++k) {
    accepted[at(m->perm[k])] = m->factor_diag[k] != 0.0;
    if (m->factor_diag[k] == 0.0) continue;
    d(k, k) = 1.0L / m->factor_diag[k];
    log_det += std::log(d(k, k));
  }
  EXPECT_TRUE(near(product(product(transposed(u), d), u), reordered(a, words(m->perm, n)), 1e-12));
  EXPECT_NEAR(m->log_det, static_cast<double>(log_det), 1e-10);
  EXPECT_NEAR(m->log_det, static_cast<double>(log_determinant(principal(a, accepted))), 1e-9);
  const Dense g = solved_identity(m);
  EXPECT_TRUE(near(product(product(a, g), a), a, 1e-11));
  EXPECT_TRUE(near(product(product(g, a), g), g, 1e-10));
  EXPECT_TRUE(near(transposed(g), g, 1e-11));
  const std::vector<double> b = product(a, random.vector(n));
  std::vector<double> x(at(n));
  EXPECT_EQ(qxsminvmultv(m, b.data(), x.data(), 1), SM_OK);
  EXPECT_TRUE(near(product(a, x), b, 1e-11));
}

void PropertiesTest::check_packed(const Problem& problem, std::int64_t rank, std::int32_t format, Random& random) {
  const std::int64_t n = problem.n;
  const Dense a = problem.dense();
  SmMatrix* m = new_packed(session(), problem, format);
  ASSERT_EQ(fn().qxsmfact(m, 0), SM_OK);
  EXPECT_EQ(m->rank, rank);
  const Dense r = triangle_of_packed(m->dense_factor, n, format);
  EXPECT_TRUE(near(product(transposed(r), r), a, 1e-12));
  const std::vector<double> b = product(a, random.vector(n));
  std::vector<double> x(at(n));
  EXPECT_EQ(fn().qxsmsubst(m, b.data(), x.data(), 1), SM_OK);
  EXPECT_TRUE(near(product(a, x), b, 1e-11));
  EXPECT_EQ(fn().qxsmsoldirect(m, b.data(), x.data(), 1), SM_OK);
  EXPECT_TRUE(near(product(a, x), b, 1e-11));
  const Dense g = dense_of_packed(m->dense_factor, n, format);
  EXPECT_TRUE(near(product(product(a, g), a), a, 1e-11));
  EXPECT_TRUE(near(product(product(g, a), g), g, 1e-10));
  destroy(m);
}

TEST_P(PropertiesTest, hold_for_definite_matrices_on_random_graphs) {
  for (std::uint64_t seed = 1000; seed < 1250; ++seed) {
    Random random(seed);
    const Problem problem = positive_definite(any_graph(random, 34), random);
    if (problem.n == 0) continue;
    SmMatrix* m = assembled(problem, random);
    check_sparse(m, problem, problem.n, random);
    destroy(m);
    for (const std::int32_t format : kFormats) check_packed(problem, problem.n, format, random);
    if (HasFailure()) FAIL() << "seed " << seed;
  }
}

TEST_P(PropertiesTest, hold_for_cross_products_with_repeated_and_zero_columns) {
  for (std::uint64_t seed = 2000; seed < 2250; ++seed) {
    Random random(seed);
    const Semidefinite s = cross_product(random, 1 + random.below(18), random.below(7), random.below(5));
    SmMatrix* m = assembled(s.problem, random);
    check_sparse(m, s.problem, s.rank, random);
    destroy(m);
    for (const std::int32_t format : kFormats) check_packed(s.problem, s.rank, format, random);
    if (HasFailure()) FAIL() << "seed " << seed;
  }
}

// The Laplacian of a graph plus nothing: one null vector for each connected part.
TEST_P(PropertiesTest, hold_for_graph_laplacians) {
  for (std::uint64_t seed = 3000; seed < 3200; ++seed) {
    Random random(seed);
    const Graph graph = any_graph(random, 28);
    if (graph.n == 0) continue;
    Problem problem{"laplacian", graph.n, {}};
    std::vector<double> degree(at(graph.n), 0.0);
    Indices part = natural_order(graph.n);
    for (const auto& [i, j] : graph.edges) {
      problem.upper.push_back({i, j, -1.0});
      degree[at(i)] += 1.0;
      degree[at(j)] += 1.0;
      const std::int64_t from = part[at(j)];
      std::replace(part.begin(), part.end(), from, std::int64_t{part[at(i)]});
    }
    for (std::int64_t i = 0; i < graph.n; ++i) problem.upper.push_back({i, i, degree[at(i)]});
    std::sort(part.begin(), part.end());
    const auto parts = std::unique(part.begin(), part.end()) - part.begin();
    SmMatrix* m = assembled(problem, random);
    check_sparse(m, problem, graph.n - parts, random);
    destroy(m);
    for (const std::int32_t format : kFormats) check_packed(problem, graph.n - parts, format, random);
    if (HasFailure()) FAIL() << "seed " << seed;
  }
}

TEST_P(PropertiesTest, hold_for_larger_structures) {
  Random random(7);
  for (const Graph& graph : {grid(9, 8), relabelled(grid(8, 8), random.permutation(64)), arrowhead(70, 2),
                             blocks(random, 12, 6), path(80), random_tree(random, 75)}) {
    const Problem problem = positive_definite(graph, random);
    SmMatrix* m = assembled(problem, random);
    check_sparse(m, problem, problem.n, random);
    destroy(m);
  }
}

// Every symmetric matrix of order 1 and 2 over a few values, indefinite ones included, against the dense rule.
TEST_P(PropertiesTest, the_rule_of_the_pivots_holds_for_every_small_matrix) {
  const std::vector<double> values{-1.0, -0.0625, 0.0, 0.25, 1.0, 4.0};
  for (const double p : values)
    for (const double q : values)
      for (const double r : values) {
        const Problem problem = problem_of({{p, q}, {q, r}});
        for (const Indices& order : {Indices{0, 1}, Indices{1, 0}}) {
          const DenseFactor want = factor_with_drops(reordered(problem.dense(), order), tolerance());
          SmMatrix* m = new_sparse(session(), problem);
          ASSERT_EQ(qxsmmd(m), SM_OK);
          impose_order(m, order);
          ASSERT_EQ(fn().qxsmfact(m, 0), want.definite ? SM_OK : SM_NOT_DEFINITE) << p << " " << q << " " << r;
          EXPECT_EQ(m->definite, want.definite ? 1 : 0);
          if (want.definite) {
            EXPECT_EQ(m->rank, want.rank) << p << " " << q << " " << r;
            EXPECT_TRUE(near(stored_u(m), want.u, 0.0)) << p << " " << q << " " << r;
          }
          destroy(m);
        }
        const DenseFactor want = factor_with_drops(problem.dense(), tolerance());
        for (const std::int32_t format : kFormats) {
          SmMatrix* m = new_packed(session(), problem, format);
          ASSERT_EQ(fn().qxsmfact(m, 1), want.definite ? SM_OK : SM_NOT_DEFINITE) << p << " " << q << " " << r;
          if (want.definite) {
            EXPECT_EQ(m->rank, want.rank) << p << " " << q << " " << r;
          }
          destroy(m);
        }
      }
  for (const double p : {-0.2, -0.0625, 0.0, 1.0 / 64, 4.0}) {
    SmMatrix* m = new_sparse(session(), problem_of({{p}}));
    EXPECT_EQ(fn().qxsmfact(m, 0), p == -0.2 ? SM_NOT_DEFINITE : SM_OK);
    if (p != -0.2) {
      EXPECT_EQ(m->rank, p > 0.0 ? 1 : 0);
      EXPECT_EQ(solved_identity(m)(0, 0), p > 0.0 ? 1.0L / p : 0.0L);
    }
  }
}

TEST_P(PropertiesTest, an_empty_matrix_is_no_error_anywhere) {
  std::vector<double> b{1.0};
  std::vector<double> x{-777.0};
  SmMatrix* sparse = nullptr;
  SmMatrix* packed_matrix = nullptr;
  SmMatrix* diagonal = nullptr;
  ASSERT_EQ(fn().qxsmnewss(instance(), &sparse, 0), SM_OK);
  ASSERT_EQ(fn().qxsmnewds(instance(), &packed_matrix, 0), SM_OK);
  ASSERT_EQ(fn().qxsmnewsd(instance(), &diagonal, 0), SM_OK);
  for (SmMatrix* m : {sparse, packed_matrix, diagonal}) {
    EXPECT_EQ(fn().qxsmclose(m, 0.0), SM_OK);
    EXPECT_EQ(qxsmmd(m), SM_OK);
    EXPECT_EQ(qxsmreorder(m), SM_OK);
    EXPECT_EQ(qxsmsymbfact(m), SM_OK);
    EXPECT_EQ(qxsmnumfact(m), SM_OK);
    EXPECT_EQ(fn().qxsmfact(m, 0), SM_OK);
    EXPECT_EQ(fn().qxsmsubst(m, b.data(), x.data(), 1), SM_OK);
    EXPECT_EQ(qxsminvmultv(m, b.data(), x.data(), 1), SM_OK);
    EXPECT_EQ(fn().qxsmsoldirect(m, b.data(), x.data(), 1), SM_OK);
    EXPECT_EQ(m->state, SM_STATE_CLOSED);
  }
  EXPECT_EQ(x[0], -777.0);
}

}  // namespace
}  // namespace sm::test
