// qxsmhermite: H = A^- A.
#include "ginv/ginv_support.hpp"

namespace sm::test {
namespace {

class HermiteTest : public ModuleTest {
 protected:
  SmMatrix* with(Shape shape, const Dense& a) { return build(session(), shape, a); }
  // A result that holds something else before.
  SmMatrix* result(Shape shape) { return with(shape, from_rows({{7}})); }
  SmStatus hermite(SmMatrix* a, SmMatrix* h) { return fn().qxsmhermite(a, h); }
  // Answers the status of a refusal that must leave both as they were.
  SmStatus refused(SmMatrix* a, SmMatrix* h) {
    const Snapshot before_a = snapshot(a);
    const Snapshot before_h = snapshot(h);
    const SmStatus status = hermite(a, h);
    EXPECT_TRUE(snapshot(a) == before_a && snapshot(h) == before_h);
    return status;
  }
};
INSTANTIATE_BOTH_HOSTS(HermiteTest);

Dense hermite_of(const SmMatrix* m, const Dense& a) { return product(generalized_inverse_of(m, a).inverse, a); }

TEST_P(HermiteTest, of_a_packed_matrix_is_the_product_with_its_generalized_inverse) {
  for (const Named& problem : semidefinite_problems())
    for (const Shape shape : kPacked)
      for (const Shape h_shape : kGeneralShapes) {
        SCOPED_TRACE(problem.name + ' ' + name_of(shape) + " into " + name_of(h_shape));
        SmMatrix* a = with(shape, problem.a);
        SmMatrix* h = result(h_shape);
        ASSERT_EQ(hermite(a, h), SM_OK);
        EXPECT_TRUE(near(contents(h), hermite_of(a, problem.a), 1e-10));
        EXPECT_EQ(h->state, SM_STATE_CLOSED);
        EXPECT_EQ(a->state, SM_STATE_INVERTED);
        EXPECT_TRUE(near(contents(a), problem.a, 0.0)) << "the values are kept";
        EXPECT_TRUE(near(contents(a, a->dense_factor), generalized_inverse(problem.a).inverse, 1e-10));
        ASSERT_EQ(hermite(a, h), SM_OK) << "from the inverse that is there";
        EXPECT_TRUE(near(contents(h), hermite_of(a, problem.a), 1e-10));
      }
}

TEST_P(HermiteTest, of_a_sparse_matrix_is_the_product_with_its_generalized_inverse) {
  Random random(91);
  for (int round = 0; round < 10; ++round) {
    const Semidefinite s = cross_product(random, 2 + random.below(8), random.below(6), random.below(3));
    const Dense a = s.problem.dense();
    for (const Shape h_shape : kGeneralShapes) {
      SmMatrix* m = new_sparse(session(), s.problem);
      ASSERT_EQ(bring_to(m, SM_STATE_CLOSED + round % 5), SM_OK);
      SmMatrix* h = result(h_shape);
      ASSERT_EQ(hermite(m, h), SM_OK);
      EXPECT_EQ(m->state, SM_STATE_FACTORED);
      const Dense want = hermite_of(m, a);
      EXPECT_TRUE(near(contents(h), want, 1e-9)) << "round " << round << ' ' << name_of(h_shape);
      EXPECT_TRUE(near(product(contents(h), contents(h)), contents(h), 1e-8)) << "idempotent";
      EXPECT_TRUE(near(contents(m), a, 0.0));
      ASSERT_EQ(hermite(m, h), SM_OK) << "from the factor that is there";
      EXPECT_TRUE(near(contents(h), want, 1e-9));
    }
  }
}

TEST_P(HermiteTest, of_a_definite_matrix_is_the_identity) {
  Random random(92);
  const Dense a = positive_definite(grid(3, 3), random).dense();
  for (const Shape shape : kSymmetricShapes)
    for (const Shape h_shape : kGeneralShapes) {
      SmMatrix* h = result(h_shape);
      ASSERT_EQ(hermite(with(shape, a), h), SM_OK);
      EXPECT_TRUE(near(contents(h), identity(9), 1e-12)) << name_of(shape) << " into " << name_of(h_shape);
    }
}

TEST_P(HermiteTest, of_a_sparse_matrix_stores_nothing_small) {
  Random random(93);
  for (int round = 0; round < 10; ++round) {
    const Semidefinite s = cross_product(random, 6, 3, 1);
    SmMatrix* m = new_sparse(session(), s.problem);
    SmMatrix* h = result(kGeneralSparse);
    ASSERT_EQ(hermite(m, h), SM_OK);
    const Reference g = generalized_inverse_of(m, s.problem.dense());
    const Nonzeros stored = entries(h);
    EXPECT_GE(stored.size(), static_cast<std::size_t>(g.rank));
    for (const auto& [place, value] : stored) {
      EXPECT_GT(std::fabs(value), kSingular) << place.first << ' ' << place.second;
      EXPECT_TRUE(g.accepted[at(place.first)]) << "the row of a dropped pivot is empty";
    }
  }
}

TEST_P(HermiteTest, of_two_equal_rows_keeps_the_first_row_of_the_order) {
  SmMatrix* m = with(kSymmetricSparse, from_rows({{2, 2}, {2, 2}}));
  ASSERT_EQ(qxsmmd(m), SM_OK);
  impose_order(m, natural_order(2));
  SmMatrix* h = result(kGeneralSparse);
  ASSERT_EQ(hermite(m, h), SM_OK);
  EXPECT_EQ(entries(h), (Nonzeros{{{0, 0}, 1.0}, {{0, 1}, 1.0}}));
  EXPECT_EQ(h->rows, 2);
  EXPECT_EQ(h->cols, 2);
}

TEST_P(HermiteTest, an_element_above_the_threshold_is_stored_and_one_at_it_is_not) {
  // The order is the natural one and A^- is the identity in the first two places, so that column 2 comes back as it is.
  for (const auto& [small, stored] : {std::pair{kSingular, false}, {std::nextafter(kSingular, 1.0), true}}) {
    SmMatrix* m = with(kSymmetricSparse, from_rows({{1, 0, small}, {0, 1, 0}, {small, 0, 0}}));
    ASSERT_EQ(qxsmmd(m), SM_OK);
    impose_order(m, natural_order(3));
    SmMatrix* h = result(kGeneralSparse);
    ASSERT_EQ(hermite(m, h), SM_OK);
    ASSERT_EQ(m->rank, 2);
    EXPECT_EQ(entries(h).count({0, 2}), stored ? 1U : 0U);
    EXPECT_EQ(entries(h).size(), stored ? 3U : 2U);
  }
}

TEST_P(HermiteTest, of_a_diagonal_matrix_holds_1_for_what_is_inverted_and_0_for_the_rest) {
  for (const Shape shape : kDiagonalShapes)
    for (const Shape h_shape : {kGeneralSparse, kGeneralColumns, kGeneralRows, kDiagonalColumns, kDiagonalRows}) {
      SmMatrix* a = with(shape, from_diagonal({2, 0, -0.00005, 0.5}));
      SmMatrix* h = result(h_shape);
      ASSERT_EQ(hermite(a, h), SM_OK);
      EXPECT_TRUE(near(contents(h), from_diagonal({1, 0, 0, 1}), 0.0)) << name_of(h_shape);
      EXPECT_EQ(h->rows, 4);
      if (is_sparse(h_shape)) {
        EXPECT_EQ(h->nnz, 4) << "zeros are written too";
      }
      EXPECT_EQ(a->state, SM_STATE_INVERTED);
      EXPECT_EQ(doubles(a->values, 4), (std::vector<double>{2, 0, -0.00005, 0.5}));
      EXPECT_EQ(doubles(a->dense_factor, 4), (std::vector<double>{0.5, 0, 0, 2}));
      ASSERT_EQ(hermite(a, h), SM_OK) << "again";
      EXPECT_TRUE(near(contents(h), from_diagonal({1, 0, 0, 1}), 0.0));
    }
}

TEST_P(HermiteTest, vectors_are_estimable_by_the_form_as_by_the_matrix) {
  Random random(94);
  const Dense a = cross_product(random, 5, 3, 1).problem.dense();
  std::vector<double> x;
  for (int v = 0; v < 8; ++v) {
    std::vector<double> one = random.vector(9);
    if (v % 2) one = product(a, one);
    x.insert(x.end(), one.begin(), one.end());
  }
  for (const Shape shape : kSymmetricShapes) {
    SmMatrix* m = with(shape, a);
    std::vector<std::int32_t> by_matrix(8);
    std::vector<std::int32_t> by_form(8);
    std::int64_t failed = 0;
    ASSERT_EQ(fn().qxsmcke(m, x.data(), 8, &failed, by_matrix.data(), 'G', 1e-8), SM_OK);
    EXPECT_EQ(failed, 4);
    SmMatrix* fresh = with(shape, a);
    SmMatrix* h = result(kGeneralSparse);
    ASSERT_EQ(hermite(fresh, h), SM_OK);
    ASSERT_EQ(fn().qxsmcke(h, x.data(), 8, &failed, by_form.data(), 'H', 1e-8), SM_OK);
    EXPECT_EQ(by_form, by_matrix) << name_of(shape);
  }
}

TEST_P(HermiteTest, a_factored_matrix_is_inverted_from_its_factor_when_that_is_kept_apart) {
  const Dense a = from_rows({{4, 2}, {2, 5}});
  for (const Shape shape : kPacked) {
    SmMatrix* apart = with(shape, a);
    ASSERT_EQ(fn().qxsmfact(apart, 0), SM_OK);
    SmMatrix* h = result(kGeneralRows);
    ASSERT_EQ(hermite(apart, h), SM_OK);
    EXPECT_TRUE(near(contents(h), identity(2), 1e-15));
    SmMatrix* factored = with(shape, a);
    ASSERT_EQ(fn().qxsmfact(factored, 1), SM_OK);
    EXPECT_EQ(hermite(factored, h), SM_NO_FACTOR);
    SmMatrix* inverted = with(shape, a);
    ASSERT_EQ(fn().qxsminv(inverted, 1, kNan), SM_OK);
    EXPECT_EQ(hermite(inverted, h), SM_NO_FACTOR);
  }
}

TEST_P(HermiteTest, work_does_not_outlive_the_call) {
  for (const Shape shape : {kSymmetricSparse, kSymmetricColumns, kSymmetricRows, kDiagonalRows}) {
    SmMatrix* a = with(shape, from_diagonal({4, 0, 9}));
    SmMatrix* h = result(kGeneralColumns);
    ASSERT_EQ(hermite(a, h), SM_OK);
    const std::int64_t blocks = host().live_blocks();
    const std::int64_t pools = host().live_pools();
    for (int again = 0; again < 15; ++again) ASSERT_EQ(hermite(a, h), SM_OK);
    EXPECT_EQ(host().live_blocks(), blocks) << name_of(shape);
    EXPECT_EQ(host().live_pools(), pools) << name_of(shape);
  }
}

TEST_P(HermiteTest, a_result_that_memory_is_wanting_for_is_not_passed_off_as_one) {
  for (const Shape shape : {kSymmetricSparse, kDiagonalRows})
    for (const Shape h_shape : kGeneralShapes) {
      SmMatrix* a = with(shape, from_diagonal({4, 9}));
      ASSERT_EQ(fn().qxsmfact(a, 0), SM_OK);
      SmMatrix* h = new_typed(session(), h_shape);
      host().fail_request(0, false);  // the sizing
      EXPECT_EQ(hermite(a, h), SM_NO_MEMORY) << name_of(shape) << " into " << name_of(h_shape);
      EXPECT_EQ(host().stop_failing(), 1);
      ASSERT_EQ(hermite(a, h), SM_OK);
      EXPECT_TRUE(near(contents(h), identity(2), 1e-15));
    }
}

TEST_P(HermiteTest, its_checks_come_in_order) {
  SmMatrix* h = result(kGeneralRows);
  EXPECT_EQ(refused(new_untyped(session()), h), SM_OK);
  SmMatrix* empty = build_open(session(), Dense(0, 0));
  EXPECT_EQ(refused(empty, empty), SM_OK);  // empty before open and the same handle
  SmMatrix* none = new_untyped_with_an_entry(session());
  EXPECT_EQ(refused(none, none), SM_UNTYPED);  // the kind before the state
  SmMatrix* open = build_open(session(), from_diagonal({1}));
  EXPECT_EQ(refused(open, open), SM_NOT_CLOSED);  // the state before the same handle
  SmMatrix* wide = with(kGeneralRows, from_rows({{1, 2, 3}, {4, 5, 6}}));
  EXPECT_EQ(refused(wide, wide), SM_BAD_ARGUMENT);                  // the same handle before the shape
  EXPECT_EQ(refused(wide, result(kSymmetricRows)), SM_NOT_SQUARE);  // the shape before the kinds
  for (const Shape shape : kShapes) {
    if (shape.kind == SM_KIND_GENERAL) continue;
    SmMatrix* self = with(shape, from_diagonal({1, 2}));
    EXPECT_EQ(refused(self, self), SM_BAD_ARGUMENT) << name_of(shape);
  }
}

TEST_P(HermiteTest, a_result_of_another_kind_is_sized_and_refused) {
  for (const Shape shape : kShapes)
    for (const Shape h_shape : kShapes) {
      if (h_shape.kind == SM_KIND_GENERAL || (shape.kind == SM_KIND_DIAGONAL && h_shape.kind == SM_KIND_DIAGONAL))
        continue;
      if (shape.kind == SM_KIND_GENERAL) continue;
      SCOPED_TRACE(name_of(shape) + " into " + name_of(h_shape));
      SmMatrix* a = with(shape, from_diagonal({4, 9, 16}));
      const Snapshot before = snapshot(a);
      SmMatrix* h = result(h_shape);
      EXPECT_EQ(hermite(a, h), SM_KIND_MISMATCH);
      EXPECT_EQ(h->rows, 3);
      EXPECT_TRUE(near(contents(h), Dense(3, 3), 0.0));
      EXPECT_TRUE(snapshot(a) == before) << "nothing is inverted or factored";
    }
  for (const Shape shape : {kSymmetricSparse, kSymmetricRows, kDiagonalRows}) {
    EXPECT_EQ(refused(with(shape, from_diagonal({4})), new_untyped(session())), SM_KIND_MISMATCH);
  }
}

TEST_P(HermiteTest, of_a_general_matrix_answers_124_with_the_result_sized) {
  for (const Shape shape : kGeneralShapes)
    for (const Shape h_shape : kShapes) {
      SmMatrix* a = with(shape, from_rows({{1, 2}, {3, 4}}));
      SmMatrix* h = result(h_shape);
      EXPECT_EQ(hermite(a, h), SM_UNAVAILABLE) << name_of(shape) << " into " << name_of(h_shape);
      EXPECT_EQ(h->rows, 2);
      EXPECT_TRUE(near(contents(h), Dense(2, 2), 0.0));
    }
}

TEST_P(HermiteTest, an_indefinite_matrix_answers_as_factoring_and_inverting_do) {
  for (const Shape shape : kSymmetricShapes) {
    SmMatrix* a = with(shape, from_rows({{4, 1}, {1, -3}}));
    EXPECT_EQ(hermite(a, result(kGeneralRows)), SM_NOT_DEFINITE) << name_of(shape);
  }
}

TEST_P(HermiteTest, a_diagonal_matrix_that_cannot_be_inverted_answers_123) {
  for (const Shape shape : kDiagonalShapes) {
    EXPECT_EQ(hermite(with(shape, from_diagonal({4, -0.001})), result(kGeneralRows)), SM_NO_ELEMENT);
    SmMatrix* factored = with(shape, from_diagonal({4, 9}));
    ASSERT_EQ(fn().qxsmfact(factored, 1), SM_OK);
    EXPECT_EQ(hermite(factored, result(kGeneralRows)), SM_NO_ELEMENT);
    SmMatrix* inverted = with(shape, from_diagonal({4, 9}));
    ASSERT_EQ(fn().qxsminv(inverted, 1, kNan), SM_OK);
    EXPECT_EQ(hermite(inverted, result(kDiagonalRows)), SM_NO_ELEMENT);
  }
}

}  // namespace
}  // namespace sm::test
