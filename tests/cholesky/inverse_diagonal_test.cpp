// qxsminvdiag: the diagonal of the inverse, of every kind, from every state.
#include <cmath>

#include "cholesky/cholesky_support.hpp"

namespace sm::test {
namespace {

constexpr std::int32_t kFormats[] = {SM_FORMAT_COLUMNS, SM_FORMAT_ROWS};
constexpr double kTolerance = 1.110223024625157e-12;
constexpr double kUntouched = -777.0;

// Of the inverse of the block of pivots that are accepted in the order, and 0 for the others.
std::vector<double> reference(const Dense& a, const Indices& perm) {
  const DenseFactor f = factor_with_drops(reordered(a, perm), kTolerance);
  EXPECT_TRUE(f.definite);
  std::vector<bool> accepted(perm.size());
  for (std::size_t k = 0; k < perm.size(); ++k) accepted[at(perm[k])] = f.accepted[k];
  const Dense inv = inverse(principal(a, accepted));
  std::vector<double> diagonal(perm.size(), 0.0);
  for (std::size_t i = 0, next = 0; i < perm.size(); ++i)
    if (accepted[i]) {
      const auto p = static_cast<std::int64_t>(next++);
      diagonal[i] = static_cast<double>(inv(p, p));
    }
  return diagonal;
}

class InverseDiagonalTest : public ModuleTest {
 protected:
  // n values and one behind them, which must be left alone.
  std::vector<double> diagonal_of(SmMatrix* m, SmStatus expected = SM_OK) {
    std::vector<double> x(at(m->rows) + 1, kUntouched);
    EXPECT_EQ(fn().qxsminvdiag(m, x.data()), expected);
    EXPECT_EQ(x.back(), kUntouched);
    x.pop_back();
    return x;
  }
  SmStatus refused(SmMatrix* m, std::vector<double>& x) {
    x.assign(16, kUntouched);
    return fn().qxsminvdiag(m, x.data());
  }
  // Answers the status of a refusal that must leave the output alone.
  SmStatus untouched(SmMatrix* m) {
    std::vector<double> x;
    const SmStatus status = refused(m, x);
    EXPECT_EQ(x, std::vector<double>(16, kUntouched));
    return status;
  }
  // Answers the status of a refusal that must leave zeros for the rows of the matrix.
  SmStatus cleared(SmMatrix* m) {
    std::vector<double> x;
    const SmStatus status = refused(m, x);
    std::vector<double> want(16, kUntouched);
    for (std::int64_t i = 0; i < m->rows; ++i) want[at(i)] = 0.0;
    EXPECT_EQ(x, want);
    return status;
  }
};
INSTANTIATE_BOTH_HOSTS(InverseDiagonalTest);

TEST_P(InverseDiagonalTest, of_a_definite_sparse_matrix_in_its_own_numbering_from_every_state) {
  Random random(11);
  for (int round = 0; round < 12; ++round) {
    const Problem problem = positive_definite(any_graph(random, 40), random);
    if (problem.n == 0) continue;
    const std::vector<double> want = reference(problem.dense(), natural_order(problem.n));
    for (std::int32_t state = SM_STATE_CLOSED; state <= SM_STATE_FACTORED; ++state) {
      SmMatrix* m = new_sparse(session(), problem);
      ASSERT_EQ(bring_to(m, state), SM_OK);
      EXPECT_TRUE(near(diagonal_of(m), want, 1e-12)) << "round " << round << " state " << state;
      EXPECT_EQ(m->state, SM_STATE_FACTORED);
      EXPECT_TRUE(near(diagonal_of(m), want, 1e-12)) << "again";
    }
  }
}

TEST_P(InverseDiagonalTest, of_a_singular_sparse_matrix_leaves_out_the_dropped_rows) {
  Random random(12);
  for (int round = 0; round < 12; ++round) {
    const Semidefinite s = cross_product(random, 2 + random.below(12), random.below(8), random.below(4));
    SmMatrix* m = new_sparse(session(), s.problem);
    const std::vector<double> x = diagonal_of(m);
    EXPECT_EQ(m->rank, s.rank);
    EXPECT_TRUE(near(x, reference(s.problem.dense(), words(m->perm, m->rows)), 1e-9)) << "round " << round;
  }
}

TEST_P(InverseDiagonalTest, a_dropped_pivot_neither_gives_nor_receives) {
  // Row 1 repeats row 0, and row 2 is bound to both.
  const Problem problem = problem_of({{4, 4, 2}, {4, 4, 2}, {2, 2, 5}});
  SmMatrix* m = new_sparse(session(), problem);
  ASSERT_EQ(qxsmmd(m), SM_OK);
  impose_order(m, natural_order(3));
  EXPECT_TRUE(near(diagonal_of(m), {0.3125, 0.0, 0.25}, 1e-15));
  SmMatrix* last = new_sparse(session(), problem);
  ASSERT_EQ(qxsmmd(last), SM_OK);
  impose_order(last, {2, 1, 0});
  EXPECT_TRUE(near(diagonal_of(last), {0.0, 0.3125, 0.25}, 1e-15));
}

TEST_P(InverseDiagonalTest, without_memory_it_is_found_column_by_column) {
  Random random(14);
  std::vector<Problem> problems{positive_definite(grid(9, 8), random), positive_definite(star(40, 3), random),
                                positive_definite(random_tree(random, 60), random),
                                positive_definite(empty_graph(5), random), positive_definite(clique(12), random)};
  for (int round = 0; round < 8; ++round) problems.push_back(cross_product(random, 12, 6, 3).problem);
  for (const Problem& problem : problems) {
    SmMatrix* m = new_sparse(session(), problem);
    ASSERT_EQ(fn().qxsmfact(m, 0), SM_OK);
    host().fail_request(0, true);
    const std::vector<double> x = diagonal_of(m);
    EXPECT_GT(host().stop_failing(), 0);
    EXPECT_TRUE(near(x, reference(problem.dense(), words(m->perm, m->rows)), 1e-9)) << problem.name;
    EXPECT_TRUE(near(diagonal_of(m), x, 1e-9)) << problem.name;
    std::vector<double> b(at(m->rows), 1.0);
    std::vector<double> y(at(m->rows));
    const std::vector<std::uint64_t> factor = bits(m->factor_values, m->factor_iu[m->rows]);
    EXPECT_EQ(fn().qxsmsubst(m, b.data(), y.data(), 1), SM_OK) << "the factor is as it was";
    m->state = SM_STATE_SYMBOLIC;
    EXPECT_EQ(qxsmnumfact(m), SM_OK);
    EXPECT_EQ(bits(m->factor_values, m->factor_iu[m->rows]), factor);
  }
}

TEST_P(InverseDiagonalTest, a_reciprocal_pivot_that_is_not_positive_gives_0) {
  SmMatrix* m = new_sparse(session(), problem_of({{4, 0, 0}, {0, 2, 0}, {0, 0, 8}}));
  ASSERT_EQ(fn().qxsmfact(m, 0), SM_OK);
  for (const double pivot : {-0.5, 0.0, std::nan("")}) {
    m->factor_diag[m->inv_perm[1]] = pivot;
    EXPECT_EQ(diagonal_of(m), (std::vector<double>{0.25, 0.0, 0.125})) << pivot;
  }
}

TEST_P(InverseDiagonalTest, of_a_packed_matrix_that_is_not_or_is_factored) {
  Random random(13);
  std::vector<Problem> problems{positive_definite(clique(9), random), positive_definite(grid(3, 4), random),
                                problem_of({{4.0}}), problem_of({{0.0}})};
  for (int round = 0; round < 4; ++round) problems.push_back(cross_product(random, 6, 4, 2).problem);
  for (const Problem& problem : problems) {
    const std::vector<double> want = reference(problem.dense(), natural_order(problem.n));
    for (const std::int32_t format : kFormats) {
      SmMatrix* fresh = new_packed(session(), problem, format);
      EXPECT_TRUE(near(diagonal_of(fresh), want, 1e-9));
      EXPECT_EQ(fresh->state, SM_STATE_FACTORED);
      EXPECT_EQ(doubles(fresh->values, fresh->nnz), packed(problem, format)) << "the values are kept";
      EXPECT_TRUE(near(diagonal_of(fresh), want, 1e-9)) << "again";
      for (const std::int32_t in_place : {0, 1}) {
        SmMatrix* factored = new_packed(session(), problem, format);
        ASSERT_EQ(fn().qxsmfact(factored, in_place), SM_OK);
        EXPECT_TRUE(near(diagonal_of(factored), want, 1e-9)) << "in place " << in_place;
        EXPECT_EQ(factored->dense_factor != nullptr, in_place == 0);
      }
    }
  }
}

TEST_P(InverseDiagonalTest, reads_a_packed_inverse_where_it_is_kept) {
  const Problem problem = problem_of({{4, 2, 1}, {2, 5, 3}, {1, 3, 9}});
  const std::vector<double> want = reference(problem.dense(), natural_order(3));
  for (const std::int32_t format : kFormats)
    for (const std::int16_t in_place : {std::int16_t{0}, std::int16_t{1}}) {
      SmMatrix* m = new_packed(session(), problem, format);
      ASSERT_EQ(fn().qxsminv(m, in_place, std::nan("")), SM_OK);
      EXPECT_TRUE(near(diagonal_of(m), want, 1e-14));
      EXPECT_EQ(m->state, SM_STATE_INVERTED);
      // Whatever the array holds is copied.
      double* inverse = in_place ? m->values : m->dense_factor;
      for (std::int64_t k = 0; k < 6; ++k) inverse[k] = static_cast<double>(k) - 2.5;
      std::vector<double> diagonal;
      for (std::int64_t i = 0; i < 3; ++i) diagonal.push_back(inverse[packed_position(3, format, i, i)]);
      EXPECT_EQ(diagonal_of(m), diagonal);
    }
}

TEST_P(InverseDiagonalTest, of_a_diagonal_matrix_is_its_factor) {
  for (const std::int32_t format : kFormats) {
    SmMatrix* fresh = new_diagonal(session(), {4.0, 9.0}, format);
    EXPECT_EQ(diagonal_of(fresh), (std::vector<double>{2.0, 3.0}));
    EXPECT_EQ(fresh->state, SM_STATE_FACTORED);
    EXPECT_EQ(doubles(fresh->values, 2), (std::vector<double>{4.0, 9.0}));
    EXPECT_EQ(diagonal_of(fresh), (std::vector<double>{2.0, 3.0})) << "again";
    for (const std::int32_t in_place : {0, 1}) {
      SmMatrix* factored = new_diagonal(session(), {2.25, 0.0, 16.0, -0.00005}, format);
      ASSERT_EQ(fn().qxsmfact(factored, in_place), SM_OK);
      EXPECT_EQ(diagonal_of(factored), (std::vector<double>{1.5, 0.0, 4.0, 0.0})) << in_place;
    }
  }
}

TEST_P(InverseDiagonalTest, of_an_inverted_diagonal_matrix_is_its_inverse) {
  for (const std::int32_t format : kFormats)
    for (const std::int16_t in_place : {std::int16_t{0}, std::int16_t{1}}) {
      SmMatrix* m = new_diagonal(session(), {4.0, 0.0, 0.5}, format);
      ASSERT_EQ(fn().qxsminv(m, in_place, std::nan("")), SM_OK);
      EXPECT_EQ(diagonal_of(m), (std::vector<double>{0.25, 0.0, 2.0})) << in_place;
      EXPECT_EQ(m->state, SM_STATE_INVERTED);
    }
}

TEST_P(InverseDiagonalTest, its_checks_come_in_order) {
  EXPECT_EQ(untouched(new_untyped(session())), SM_OK);
  EXPECT_EQ(untouched(new_general(session(), 0, 0)), SM_OK);
  EXPECT_EQ(untouched(new_sparse(session(), Problem{"empty", 0, {}}, false)), SM_OK);  // empty before open
  SmMatrix* none = new_untyped(session());
  none->nnz = 1;
  EXPECT_EQ(untouched(none), SM_UNTYPED);  // the kind before the state
  none->nnz = 0;
  std::vector<double> data(6, 1.0);
  EXPECT_EQ(untouched(new_open_tied(session(), data, 2, 3, SM_KIND_GENERAL, SM_FORMAT_ROWS)),
            SM_NOT_CLOSED);  // the state before the shape
  EXPECT_EQ(untouched(new_sparse(session(), problem_of({{1.0}}), false)), SM_NOT_CLOSED);
  EXPECT_EQ(untouched(new_general(session(), 2, 3)), SM_NOT_SQUARE);  // the shape before the kind
  EXPECT_EQ(cleared(new_general(session(), 3, 3)), SM_UNAVAILABLE);
  SmMatrix* general = nullptr;
  ASSERT_EQ(fn().qxsmnewsg(instance(), &general, 2, 2), SM_OK);
  ASSERT_EQ(fn().qxsmassign(general, 0, 0, 0, 4.0), SM_OK);
  EXPECT_EQ(cleared(general), SM_UNAVAILABLE);
}

TEST_P(InverseDiagonalTest, a_matrix_that_cannot_be_factored_answers_as_factoring_does_and_leaves_zeros) {
  const Problem indefinite = problem_of({{4, 1}, {1, -3}});
  SmMatrix* sparse = new_sparse(session(), indefinite);
  EXPECT_EQ(cleared(sparse), SM_NOT_DEFINITE);
  EXPECT_EQ(sparse->state, SM_STATE_SYMBOLIC);
  for (const std::int32_t format : kFormats) {
    SmMatrix* m = new_packed(session(), indefinite, format);
    EXPECT_EQ(cleared(m), SM_NOT_DEFINITE);
    EXPECT_EQ(m->state, SM_STATE_CLOSED);
    EXPECT_EQ(m->definite, 0);
    EXPECT_EQ(doubles(m->values, 3), packed(indefinite, format));
    EXPECT_EQ(cleared(new_diagonal(session(), {4.0, -0.001}, format)), SM_NOT_DEFINITE);
  }
}

TEST_P(InverseDiagonalTest, every_request_may_be_refused) {
  struct Case {
    SmMatrix* (*create)(Session&);
    bool factored;
    std::int64_t least;
    std::int64_t most;
  };
  const auto sparse = [](Session& s) { return new_sparse(s, problem_of({{4, 2, 0}, {2, 5, 1}, {0, 1, 8}})); };
  const auto columns = [](Session& s) { return new_packed(s, problem_of({{4, 2}, {2, 5}}), SM_FORMAT_COLUMNS); };
  const auto rows = [](Session& s) { return new_packed(s, problem_of({{4, 2}, {2, 5}}), SM_FORMAT_ROWS); };
  const auto diagonal = [](Session& s) { return new_diagonal(s, {4.0, 9.0}); };
  for (const Case& c :
       {Case{sparse, false, 3, 99}, Case{sparse, true, 4, 4}, Case{columns, false, 2, 99}, Case{columns, true, 1, 1},
        Case{rows, false, 2, 99}, Case{rows, true, 1, 1}, Case{diagonal, false, 1, 1}, Case{diagonal, true, 0, 0}}) {
    std::int64_t requests = 0;
    for (const bool for_ever : {false, true})
      for (std::int64_t k = 0;; ++k) {
        Session s(GetParam());
        SmMatrix* m = c.create(s);
        if (c.factored) {
          ASSERT_EQ(s.fn().qxsmfact(m, 0), SM_OK);
        }
        const std::int64_t loose = s.host().live_blocks() - owned_blocks(m);
        std::vector<double> x(at(m->rows), kUntouched);
        s.host().fail_request(k, for_ever);
        const SmStatus status = s.fn().qxsminvdiag(m, x.data());
        const bool met = s.host().stop_failing() > 0;
        // A sparse matrix needs no memory once it is factored: it goes on column by column.
        const bool answered = !met || (m->format == SM_FORMAT_SPARSE && m->state == SM_STATE_FACTORED);
        EXPECT_EQ(status, answered ? SM_OK : SM_NO_MEMORY) << "request " << k;
        EXPECT_EQ(s.host().live_blocks() - owned_blocks(m), loose) << "request " << k;
        requests = k;
        if (!met) break;
        const std::vector<double> refused = x;
        EXPECT_EQ(s.fn().qxsminvdiag(m, x.data()), SM_OK);
        EXPECT_GT(x[0], 0.0);
        EXPECT_TRUE(near(refused, answered ? x : std::vector<double>(x.size(), 0.0), 1e-15)) << "request " << k;
        EXPECT_EQ(s.host().violations(), 0);
      }
    EXPECT_GE(requests, c.least);
    EXPECT_LE(requests, c.most);
  }
}

TEST_P(InverseDiagonalTest, a_tied_record_without_a_pool_gets_one) {
  const Problem problem = problem_of({{4, 2}, {2, 5}});
  for (const std::int32_t format : kFormats) {
    std::vector<double> data = packed(problem, format);
    SmMatrix* m = new_open_tied(session(), data, 2, 2, SM_KIND_SYMMETRIC, format);
    ASSERT_EQ(fn().qxsmclose(m, 0.0), SM_OK);
    EXPECT_TRUE(near(diagonal_of(m), {0.3125, 0.25}, 1e-15));
    EXPECT_EQ(data, packed(problem, format));
  }
}

}  // namespace
}  // namespace sm::test
