// qxsminv: the generalized inverse of packed and diagonal matrices, and what it records.
#include "ginv/ginv_support.hpp"

namespace sm::test {
namespace {

constexpr std::int16_t kApart = 0;
constexpr std::int16_t kInPlace = 1;

class InversionTest : public ModuleTest {
 protected:
  SmMatrix* with(Shape shape, const Dense& a) { return build(session(), shape, a); }
  SmMatrix* diagonal(Shape shape, const std::vector<double>& d) { return with(shape, from_diagonal(d)); }
  SmStatus invert(SmMatrix* m, std::int16_t in_place, double tolerance = kNan) {
    return fn().qxsminv(m, in_place, tolerance);
  }
  // Answers the status of a refusal that must leave the matrix as it was.
  SmStatus refused(SmMatrix* m, std::int16_t in_place) {
    const Snapshot before = snapshot(m);
    const SmStatus status = invert(m, in_place);
    EXPECT_TRUE(snapshot(m) == before);
    return status;
  }
  // Expects an inverted matrix: the inverse where it belongs, the values kept when it is apart.
  void expect_inverted(SmMatrix* m, std::int16_t in_place, const Dense& a, const Dense& inverse, double tolerance) {
    EXPECT_EQ(m->state, SM_STATE_INVERTED);
    EXPECT_EQ(m->dense_factor != nullptr, in_place == kApart);
    EXPECT_TRUE(near(contents(m, m->dense_factor), inverse, tolerance));
    if (in_place == kApart) {
      EXPECT_TRUE(near(contents(m), a, 0.0)) << "the values";
    }
  }
};
INSTANTIATE_BOTH_HOSTS(InversionTest);

TEST_P(InversionTest, of_a_packed_matrix_is_the_inverse_of_its_accepted_block) {
  for (const Named& problem : semidefinite_problems())
    for (const Shape shape : kPacked)
      for (const std::int16_t in_place : {kApart, kInPlace}) {
        SCOPED_TRACE(problem.name + ' ' + name_of(shape) + (in_place ? " in place" : " apart"));
        const Reference want = generalized_inverse(problem.a);
        SmMatrix* m = with(shape, problem.a);
        ASSERT_EQ(invert(m, in_place), SM_OK);
        expect_inverted(m, in_place, problem.a, want.inverse, 1e-10);
        EXPECT_EQ(m->rank, want.rank);
        EXPECT_NEAR(m->log_det, want.log_det, 1e-10);
        EXPECT_EQ(m->definite, 1);
        EXPECT_EQ(m->owns_values, 1);
      }
}

TEST_P(InversionTest, of_a_packed_matrix_is_a_generalized_inverse) {
  for (const Named& problem : semidefinite_problems())
    for (const Shape shape : kPacked) {
      SmMatrix* m = with(shape, problem.a);
      ASSERT_EQ(invert(m, kInPlace), SM_OK);
      const Dense g = contents(m);
      EXPECT_TRUE(near(product(product(problem.a, g), problem.a), problem.a, 1e-11)) << problem.name;
      EXPECT_TRUE(near(product(product(g, problem.a), g), g, 1e-10)) << problem.name;
    }
}

TEST_P(InversionTest, the_tolerance_decides_which_packed_pivots_are_dropped) {
  const Dense a = from_rows({{1, 1}, {1, 1.0009765625}});  // the second pivot is 2^-10
  for (const Shape shape : kPacked)
    for (const auto& [tolerance, rank] : {std::pair{kNan, 2}, {1e-8, 2}, {1e-4, 2}, {1e-2, 1}, {0.5, 1}}) {
      SmMatrix* m = with(shape, a);
      ASSERT_EQ(invert(m, kApart, tolerance), SM_OK);
      EXPECT_EQ(m->rank, rank) << tolerance;
      EXPECT_TRUE(near(contents(m, m->dense_factor), rank == 2 ? inverse(a) : from_rows({{1, 0}, {0, 0}}), 1e-10))
          << tolerance;
    }
}

TEST_P(InversionTest, a_nan_selects_setting_2_of_the_instance) {
  instance()->tolerances[2] = 1e-2;
  SmMatrix* packed = with(kSymmetricRows, from_rows({{1, 1}, {1, 1.0009765625}}));
  ASSERT_EQ(invert(packed, kApart), SM_OK);
  EXPECT_EQ(packed->rank, 1);
  SmMatrix* m = diagonal(kDiagonalRows, {0.01, 0.0099});
  ASSERT_EQ(invert(m, kInPlace), SM_OK);
  EXPECT_EQ(doubles(m->values, 2), (std::vector<double>{1 / 0.01, 0.0}));
}

TEST_P(InversionTest, of_a_diagonal_matrix_inverts_what_reaches_the_tolerance) {
  for (const Shape shape : kDiagonalShapes)
    for (const std::int16_t in_place : {kApart, kInPlace}) {
      const std::vector<double> d{4, 0, -0.00005, 9};
      SmMatrix* m = diagonal(shape, d);
      ASSERT_EQ(invert(m, in_place, 1e-8), SM_OK);
      expect_inverted(m, in_place, from_diagonal(d), from_diagonal({0.25, 0, 0, 1.0 / 9}), 0.0);
      EXPECT_EQ(m->rank, 2);
      EXPECT_NEAR(m->log_det, std::log(36.0), 1e-14);
      EXPECT_EQ(m->definite, 1);
    }
}

TEST_P(InversionTest, the_test_of_a_diagonal_element_is_absolute_and_includes_the_tolerance) {
  const double below = std::nextafter(1e-3, 0.0);
  SmMatrix* m = diagonal(kDiagonalRows, {1e-3, below, 1e6, -1e-4, kNan, 0.0});
  ASSERT_EQ(invert(m, kInPlace, 1e-3), SM_OK);
  EXPECT_EQ(doubles(m->values, 6), (std::vector<double>{1 / 1e-3, 0, 1e-6, 0, 0, 0}));
  EXPECT_EQ(m->rank, 2);
  EXPECT_NEAR(m->log_det, std::log(1e3), 1e-12);
  SmMatrix* preset = diagonal(kDiagonalRows, {kSingular, std::nextafter(kSingular, 0.0)});
  ASSERT_EQ(invert(preset, kInPlace), SM_OK);
  EXPECT_EQ(doubles(preset->values, 2), (std::vector<double>{1 / kSingular, 0}));
  SmMatrix* zero = diagonal(kDiagonalRows, {2.0, 0.0});
  ASSERT_EQ(invert(zero, kInPlace, 0.0), SM_OK);
  EXPECT_EQ(doubles(zero->values, 2), (std::vector<double>{0.5, kInfinity})) << "0 reaches a tolerance of 0";
  EXPECT_EQ(zero->rank, 2);
}

TEST_P(InversionTest, a_negative_diagonal_element_ends_it_with_what_was_inverted_before) {
  for (const Shape shape : kDiagonalShapes)
    for (const std::int16_t in_place : {kApart, kInPlace})
      for (const double bad : {-0.001, std::nextafter(-0.0001, -1.0), -kInfinity}) {
        SmMatrix* m = diagonal(shape, {4, 8, bad, 16});
        m->rank = 7;
        m->log_det = 7.0;
        EXPECT_EQ(invert(m, in_place), SM_NOT_DEFINITE);
        EXPECT_EQ(m->state, SM_STATE_CLOSED);
        EXPECT_EQ(m->rank, 0);
        EXPECT_TRUE(is_missing(m->log_det));
        EXPECT_EQ(m->definite, 0);
        const std::vector<double> partly{0.25, 0.125, bad, 16};
        EXPECT_EQ(doubles(m->values, 4), in_place ? partly : (std::vector<double>{4, 8, bad, 16}));
      }
}

TEST_P(InversionTest, an_indefinite_packed_matrix_is_left_as_it_was) {
  const Dense a = from_rows({{4, 1}, {1, -3}});
  for (const Shape shape : kPacked)
    for (const std::int16_t in_place : {kApart, kInPlace}) {
      SmMatrix* m = with(shape, a);
      EXPECT_EQ(invert(m, in_place), SM_NOT_DEFINITE);
      EXPECT_EQ(m->state, SM_STATE_CLOSED);
      EXPECT_EQ(m->definite, 0);
      EXPECT_TRUE(near(contents(m), a, 0.0)) << name_of(shape) << in_place;
      EXPECT_EQ(invert(m, in_place), SM_NOT_DEFINITE) << "again";
    }
}

TEST_P(InversionTest, a_negative_pivot_at_the_limit_is_dropped_and_below_it_refused) {
  for (const Shape shape : kPacked) {
    SmMatrix* dropped = with(shape, from_diagonal({1, -0.0625}));
    ASSERT_EQ(invert(dropped, kInPlace), SM_OK);
    EXPECT_TRUE(near(contents(dropped), from_diagonal({1, 0}), 0.0));
    EXPECT_EQ(invert(with(shape, from_diagonal({1, -0.25})), kInPlace), SM_NOT_DEFINITE);
  }
}

TEST_P(InversionTest, its_checks_come_in_order) {
  for (const std::int16_t in_place : {kApart, kInPlace}) {
    EXPECT_EQ(refused(new_untyped(session()), in_place), SM_OK);
    EXPECT_EQ(refused(build_open(session(), Dense(0, 0)), in_place), SM_OK);  // empty before open
    EXPECT_EQ(refused(new_sized(session(), kGeneralSparse, 2, 3), in_place), SM_OK);
    SmMatrix* none = new_untyped_with_an_entry(session());
    EXPECT_EQ(refused(none, in_place), SM_UNTYPED);  // the kind before the state
    std::vector<double> data(6, 1.0);
    EXPECT_EQ(refused(new_open_tied(session(), data, 2, 3, SM_KIND_GENERAL, SM_FORMAT_ROWS), in_place),
              SM_NOT_CLOSED);  // the state before the shape
    EXPECT_EQ(refused(build_open(session(), from_diagonal({1})), in_place), SM_NOT_CLOSED);
    for (const Shape shape : {kGeneralSparse, kGeneralColumns, kGeneralRows}) {
      EXPECT_EQ(refused(with(shape, from_rows({{1, 2, 3}, {4, 5, 6}})), in_place), SM_NOT_SQUARE);
      EXPECT_EQ(refused(with(shape, from_diagonal({1, 2})), in_place), SM_UNAVAILABLE);
    }
  }
}

TEST_P(InversionTest, a_sparse_matrix_answers_124_in_every_state) {
  for (const std::int16_t in_place : {kApart, kInPlace})
    for (std::int32_t state = SM_STATE_CLOSED; state <= SM_STATE_FACTORED; ++state) {
      SmMatrix* m = with(kSymmetricSparse, from_rows({{4, 1}, {1, 3}}));
      ASSERT_EQ(bring_to(m, state), SM_OK);
      EXPECT_EQ(refused(m, in_place), SM_UNAVAILABLE) << state;
    }
}

}  // namespace
}  // namespace sm::test
