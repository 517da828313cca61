// qxsmpivot: which rows have a positive pivot.
#include <string>

#include "ginv/ginv_support.hpp"

namespace sm::test {
namespace {

class PivotsTest : public ModuleTest {
 protected:
  // The characters of the rows; the one behind them must be left alone.
  std::string pivots_of(SmMatrix* m) {
    std::string pivots(at(m->rows) + 1, '?');
    EXPECT_EQ(fn().qxsmpivot(m, pivots.data()), SM_OK);
    EXPECT_EQ(pivots.back(), '?');
    pivots.pop_back();
    return pivots;
  }
  // Answers the status of a refusal that must leave the output alone.
  SmStatus untouched(SmMatrix* m) {
    std::string pivots(16, '?');
    const SmStatus status = fn().qxsmpivot(m, pivots.data());
    EXPECT_EQ(pivots, std::string(16, '?'));
    return status;
  }
  SmMatrix* factored(Shape shape, const Dense& a, std::int32_t in_place = 0) {
    SmMatrix* m = build(session(), shape, a);
    EXPECT_EQ(fn().qxsmfact(m, in_place), SM_OK);
    return m;
  }
};
INSTANTIATE_BOTH_HOSTS(PivotsTest);

std::string text_of(const std::vector<bool>& flags) {
  std::string text;
  for (const bool flag : flags) text += flag ? '1' : '0';
  return text;
}

TEST_P(PivotsTest, of_a_sparse_matrix_are_told_in_the_callers_numbering) {
  Random random(41);
  for (int round = 0; round < 20; ++round) {
    const Semidefinite s = cross_product(random, 2 + random.below(12), random.below(8), random.below(4));
    SmMatrix* m = new_sparse(session(), s.problem);
    ASSERT_EQ(bring_to(m, SM_STATE_CLOSED + round % 5), SM_OK);
    const std::string pivots = pivots_of(m);
    EXPECT_EQ(m->state, SM_STATE_FACTORED);
    EXPECT_EQ(pivots, text_of(generalized_inverse_of(m, s.problem.dense()).accepted)) << "round " << round;
    EXPECT_EQ(pivots_of(m), pivots) << "again";
  }
}

TEST_P(PivotsTest, a_dependent_row_is_told_at_its_own_place_whatever_its_place_in_the_order) {
  // Row 3 is twice row 1; the order puts row 1 first, or row 3.
  const Problem problem = problem_of({{5, 0, 1, 0}, {0, 1, 0, 2}, {1, 0, 6, 0}, {0, 2, 0, 4}});
  for (const auto& [order, want] : {std::pair<Indices, std::string>{{1, 3, 0, 2}, "1110"}, {{3, 2, 1, 0}, "1011"}}) {
    SmMatrix* m = new_sparse(session(), problem);
    ASSERT_EQ(qxsmmd(m), SM_OK);
    impose_order(m, order);
    EXPECT_EQ(pivots_of(m), want);
  }
}

TEST_P(PivotsTest, of_a_packed_matrix_are_those_of_the_natural_order) {
  for (const Named& problem : semidefinite_problems())
    for (const Shape shape : kPacked) {
      SCOPED_TRACE(problem.name + ' ' + name_of(shape));
      const std::string want = text_of(generalized_inverse(problem.a).accepted);
      SmMatrix* m = build(session(), shape, problem.a);
      EXPECT_EQ(pivots_of(m), want);
      EXPECT_EQ(m->state, SM_STATE_FACTORED);
      EXPECT_EQ(doubles(m->values, m->nnz), laid_out(shape, problem.a)) << "the values are kept";
      EXPECT_EQ(pivots_of(m), want) << "again";
      EXPECT_EQ(pivots_of(factored(shape, problem.a, 1)), want) << "factored in place";
    }
}

TEST_P(PivotsTest, of_an_inverted_packed_matrix_are_those_of_its_inverse) {
  const Dense a = from_rows({{4, 4, 2}, {4, 4, 2}, {2, 2, 5}});
  for (const Shape shape : kPacked)
    for (const std::int16_t in_place : {std::int16_t{0}, std::int16_t{1}}) {
      SmMatrix* m = build(session(), shape, a);
      ASSERT_EQ(fn().qxsminv(m, in_place, kNan), SM_OK);
      EXPECT_EQ(pivots_of(m), "101") << name_of(shape) << " in place " << in_place;
      EXPECT_EQ(m->state, SM_STATE_INVERTED);
    }
}

TEST_P(PivotsTest, of_a_diagonal_matrix_are_judged_by_its_values) {
  // 1e-300 is dropped by the factorization, and is positive all the same.
  const std::vector<double> d{4.0, 0.0, 1e-300, -0.00005, kNan, kInfinity};
  for (const Shape shape : {kDiagonalColumns, kDiagonalRows}) {
    SmMatrix* m = build(session(), shape, from_diagonal(d));
    EXPECT_EQ(pivots_of(m), "101001");
    EXPECT_EQ(m->state, SM_STATE_FACTORED);
    EXPECT_EQ(m->rank, 2);
    EXPECT_EQ(pivots_of(m), "101001") << "again";
    EXPECT_EQ(pivots_of(factored(shape, from_diagonal(d), 1)), "100001") << "the roots took the values' place";
    ASSERT_EQ(fn().qxsminv(m, 0, kNan), SM_OK);
    EXPECT_EQ(pivots_of(m), "101001") << "inverted beside the values";
  }
}

TEST_P(PivotsTest, a_pivot_that_is_not_above_0_is_told_as_0) {
  for (const double pivot : {-1.0, -0.0, 0.0, kNan}) {
    SmMatrix* sparse = factored(kSymmetricSparse, from_diagonal({2, 4, 8}));
    sparse->factor_diag[sparse->inv_perm[1]] = pivot;
    EXPECT_EQ(pivots_of(sparse), "101") << pivot;
    for (const Shape shape : kPacked) {
      SmMatrix* packed = factored(shape, from_diagonal({2, 4, 8}));
      packed->dense_factor[packed_position(3, shape.format, 1, 1)] = pivot;
      EXPECT_EQ(pivots_of(packed), "101") << pivot;
    }
  }
}

TEST_P(PivotsTest, its_checks_come_in_order) {
  EXPECT_EQ(untouched(new_untyped(session())), SM_OK);
  EXPECT_EQ(untouched(build_open(session(), Dense(0, 0))), SM_OK);  // empty before open
  EXPECT_EQ(untouched(new_sized(session(), kGeneralSparse, 2, 3)), SM_OK);
  SmMatrix* none = new_untyped_with_an_entry(session());
  EXPECT_EQ(untouched(none), SM_UNTYPED);  // the kind before the state
  std::vector<double> data(6, 1.0);
  EXPECT_EQ(untouched(new_open_tied(session(), data, 2, 3, SM_KIND_GENERAL, SM_FORMAT_ROWS)),
            SM_NOT_CLOSED);  // the state before the shape
  EXPECT_EQ(untouched(build_open(session(), from_diagonal({1}))), SM_NOT_CLOSED);
  for (const Shape shape : {kGeneralSparse, kGeneralColumns, kGeneralRows}) {
    EXPECT_EQ(untouched(build(session(), shape, from_rows({{1, 2, 3}, {4, 5, 6}}))), SM_NOT_SQUARE);
  }
}

TEST_P(PivotsTest, of_a_general_matrix_are_zeros_and_a_refusal) {
  for (const Shape shape : {kGeneralSparse, kGeneralColumns, kGeneralRows}) {
    SmMatrix* m = build(session(), shape, from_rows({{1, 2}, {3, 4}}));
    std::string pivots = "???";
    EXPECT_EQ(fn().qxsmpivot(m, pivots.data()), SM_UNAVAILABLE);
    EXPECT_EQ(pivots, "00?");
    EXPECT_EQ(m->state, SM_STATE_CLOSED);
  }
}

TEST_P(PivotsTest, a_matrix_that_cannot_be_factored_answers_as_factoring_does) {
  const Dense indefinite = from_rows({{4, 1}, {1, -3}});
  for (const Shape shape : {kSymmetricSparse, kSymmetricColumns, kSymmetricRows}) {
    SmMatrix* m = build(session(), shape, indefinite);
    EXPECT_EQ(untouched(m), SM_NOT_DEFINITE) << name_of(shape);
    EXPECT_EQ(m->definite, 0);
    EXPECT_LT(m->state, SM_STATE_FACTORED);
  }
  EXPECT_EQ(untouched(build(session(), kDiagonalRows, from_diagonal({4, -0.001}))), SM_NOT_DEFINITE);
}

TEST_P(PivotsTest, a_factored_sparse_matrix_without_rows_answers_120) {
  SmMatrix* m = factored(kSymmetricSparse, from_diagonal({2, 4}));
  std::int64_t* rows = m->row_start;
  m->row_start = nullptr;
  EXPECT_EQ(untouched(m), SM_NO_FACTOR);
  m->row_start = rows;
  EXPECT_EQ(pivots_of(m), "11");
}

}  // namespace
}  // namespace sm::test
