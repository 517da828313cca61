// qxsminv on matrices that are factored or inverted already, and who owns which array afterwards.
#include "ginv/ginv_support.hpp"

namespace sm::test {
namespace {

constexpr std::int16_t kApart = 0;
constexpr std::int16_t kInPlace = 1;

class InversionStatesTest : public ModuleTest {
 protected:
  SmStatus invert(SmMatrix* m, std::int16_t in_place) { return fn().qxsminv(m, in_place, kNan); }
  SmMatrix* factored(Shape shape, std::int16_t in_place) {
    SmMatrix* m = build(session(), shape, a_);
    EXPECT_EQ(fn().qxsmfact(m, in_place), SM_OK);
    return m;
  }
  SmMatrix* inverted(Shape shape, std::int16_t in_place) {
    SmMatrix* m = build(session(), shape, a_);
    EXPECT_EQ(invert(m, in_place), SM_OK);
    return m;
  }
  void expect_inverse(SmMatrix* m, const double* array) {
    EXPECT_EQ(m->state, SM_STATE_INVERTED);
    EXPECT_TRUE(near(contents(m, array), inverse_, 1e-14)) << name_of(shape_of(m));
  }
  // A square problem that packed and diagonal matrices hold alike, and its inverse.
  const Dense a_ = from_diagonal({4, 16, 0, 64});
  const Dense inverse_ = from_diagonal({0.25, 0.0625, 0, 0.015625});
};
INSTANTIATE_BOTH_HOSTS(InversionStatesTest);

TEST_P(InversionStatesTest, a_packed_factor_becomes_the_inverse_of_what_was_factored) {
  for (const Named& problem : semidefinite_problems())
    for (const Shape shape : kPacked)
      for (const std::int16_t was_in_place : {kApart, kInPlace})
        for (const std::int16_t in_place : {kApart, kInPlace}) {
          if (was_in_place && !in_place) continue;
          SCOPED_TRACE(problem.name + ' ' + name_of(shape) + std::to_string(was_in_place) + std::to_string(in_place));
          SmMatrix* m = build(session(), shape, problem.a);
          ASSERT_EQ(fn().qxsmfact(m, was_in_place), SM_OK);
          ASSERT_EQ(invert(m, in_place), SM_OK);
          EXPECT_EQ(m->dense_factor != nullptr, in_place == kApart);
          EXPECT_TRUE(near(contents(m, m->dense_factor), generalized_inverse(problem.a).inverse, 1e-9));
          if (in_place == kApart) {
            EXPECT_TRUE(near(contents(m), problem.a, 0.0));
          }
          EXPECT_EQ(m->state, SM_STATE_INVERTED);
        }
}

TEST_P(InversionStatesTest, what_factoring_recorded_stays) {
  for (const Shape shape : kSquareFactored) {
    SmMatrix* m = factored(shape, kApart);
    m->rank = 77;
    m->log_det = 5.5;
    m->definite = -1;
    ASSERT_EQ(invert(m, kApart), SM_OK);
    expect_inverse(m, m->dense_factor);
    EXPECT_EQ(m->rank, 77) << name_of(shape);
    EXPECT_EQ(m->log_det, 5.5);
    EXPECT_EQ(m->definite, -1);
  }
}

TEST_P(InversionStatesTest, in_place_the_separate_array_becomes_the_values_and_the_old_values_go_back) {
  for (const Shape shape : kSquareFactored) {
    SmMatrix* kept = factored(shape, kApart);
    const std::int64_t blocks = host().live_blocks();
    ASSERT_EQ(invert(kept, kInPlace), SM_OK);
    EXPECT_EQ(kept->dense_factor, nullptr);
    EXPECT_EQ(kept->owns_values, 1);
    expect_inverse(kept, kept->values);
    EXPECT_EQ(host().live_blocks(), blocks - 1) << name_of(shape);
  }
}

TEST_P(InversionStatesTest, a_factor_in_place_of_the_values_cannot_be_inverted_beside_them) {
  for (const Shape shape : kSquareFactored) {
    SmMatrix* m = factored(shape, kInPlace);
    const Snapshot before = snapshot(m);
    EXPECT_EQ(invert(m, kApart), SM_NO_FACTOR) << name_of(shape);
    EXPECT_TRUE(snapshot(m) == before);
    ASSERT_EQ(invert(m, kInPlace), SM_OK);
    EXPECT_EQ(m->dense_factor, nullptr);
    expect_inverse(m, m->values);
  }
}

TEST_P(InversionStatesTest, a_diagonal_factor_inverts_the_squares_of_its_positive_elements) {
  for (const Shape shape : {kDiagonalColumns, kDiagonalRows})
    for (const std::int16_t in_place : {kApart, kInPlace}) {
      SmMatrix* m = factored(shape, in_place);
      double* factor = in_place ? m->values : m->dense_factor;
      const std::vector<double> given{0.5, -3.0, 0.0, 1e-20};
      std::copy(given.begin(), given.end(), factor);
      ASSERT_EQ(invert(m, in_place), SM_OK);
      EXPECT_EQ(doubles(factor, 4), (std::vector<double>{4.0, -3.0, 0.0, 1 / (1e-20 * 1e-20)}));
      EXPECT_EQ(m->state, SM_STATE_INVERTED);
    }
}

TEST_P(InversionStatesTest, a_kept_inverse_stays_or_becomes_the_values_when_called_again) {
  for (const Shape shape : kSquareFactored)
    for (const bool by_factor : {false, true}) {
      SmMatrix* m = by_factor ? factored(shape, kApart) : build(session(), shape, a_);
      ASSERT_EQ(invert(m, kApart), SM_OK);
      const Snapshot before = snapshot(m);
      EXPECT_EQ(invert(m, kApart), SM_OK);
      EXPECT_TRUE(snapshot(m) == before) << name_of(shape);
      const std::int64_t blocks = host().live_blocks();
      const double* inverse = m->dense_factor;
      ASSERT_EQ(invert(m, kInPlace), SM_OK);
      EXPECT_EQ(m->values, inverse);
      EXPECT_EQ(m->dense_factor, nullptr);
      EXPECT_EQ(m->owns_values, 1);
      expect_inverse(m, m->values);
      EXPECT_EQ(host().live_blocks(), blocks - 1);
    }
}

TEST_P(InversionStatesTest, an_inverse_in_place_of_the_values_answers_120_when_it_is_wanted_beside_them) {
  for (const Shape shape : kSquareFactored) {
    SmMatrix* m = inverted(shape, kInPlace);
    const Snapshot before = snapshot(m);
    EXPECT_EQ(invert(m, kApart), SM_NO_FACTOR);
    EXPECT_EQ(invert(m, kInPlace), SM_OK);
    EXPECT_TRUE(snapshot(m) == before) << name_of(shape);
  }
}

TEST_P(InversionStatesTest, inverting_in_place_keeps_the_array) {
  for (const Shape shape : kSquareFactored) {
    SmMatrix* m = build(session(), shape, a_);
    const double* array = m->values;
    ASSERT_EQ(invert(m, kInPlace), SM_OK);
    EXPECT_EQ(m->values, array);
    EXPECT_EQ(m->dense_factor, nullptr);
    expect_inverse(m, m->values);
  }
}

TEST_P(InversionStatesTest, a_stale_separate_array_is_never_taken_for_an_inverse) {
  for (const Shape shape : kSquareFactored)
    for (const std::int16_t in_place : {kApart, kInPlace})
      for (const bool by_factoring : {true, false}) {
        SCOPED_TRACE(name_of(shape) + std::to_string(in_place) + std::to_string(by_factoring));
        SmMatrix* m = build(session(), shape, from_diagonal({4, 16, -5, 64}));
        const std::int64_t blocks = host().live_blocks();
        ASSERT_EQ(by_factoring ? fn().qxsmfact(m, 0) : invert(m, kApart), SM_NOT_DEFINITE);
        ASSERT_EQ(m->state, SM_STATE_CLOSED);
        m->values[slot_of(shape, 4, 4, 2, 2)] = 0.0;  // behind the module's back: the stale array stays
        ASSERT_EQ(invert(m, in_place), SM_OK);
        EXPECT_EQ(m->dense_factor != nullptr, in_place == kApart);
        expect_inverse(m, m->dense_factor ? m->dense_factor : m->values);
        EXPECT_EQ(m->rank, 3);
        EXPECT_EQ(host().live_blocks(), blocks + (in_place == kApart));
        if (in_place == kApart) {
          EXPECT_TRUE(near(contents(m), a_, 0.0));
        }
        ASSERT_EQ(invert(m, kInPlace), SM_OK);
        expect_inverse(m, m->values);
      }
}

TEST_P(InversionStatesTest, a_tied_array_is_let_go_and_never_freed) {
  for (const Shape shape : kSquareFactored) {
    const std::vector<double> given = laid_out(shape, a_);
    for (const bool factor_first : {false, true}) {
      SCOPED_TRACE(name_of(shape) + (factor_first ? " factored" : ""));
      std::vector<double> data = given;
      SmMatrix* m = new_tied(session(), shape, data, 4, 4);
      if (factor_first) {
        ASSERT_EQ(fn().qxsmfact(m, 0), SM_OK);
      } else {
        ASSERT_EQ(invert(m, kApart), SM_OK);
        EXPECT_EQ(m->values, data.data());
        EXPECT_EQ(m->owns_values, 0);
      }
      ASSERT_EQ(invert(m, kInPlace), SM_OK);
      EXPECT_EQ(data, given) << "the caller's array is as it was";
      EXPECT_NE(m->values, data.data());
      EXPECT_EQ(m->owns_values, 1) << "what took its place is the matrix's own";
      EXPECT_EQ(m->dense_factor, nullptr);
      expect_inverse(m, m->values);
      EXPECT_EQ(fn().qxsmresize(m, 3, 3), SM_OK) << "and goes back like any other";
    }
    std::vector<double> data = given;
    SmMatrix* m = new_tied(session(), shape, data, 4, 4);
    ASSERT_EQ(invert(m, kInPlace), SM_OK);
    EXPECT_EQ(m->values, data.data()) << "inverted where it lies";
    EXPECT_EQ(m->owns_values, 0);
    expect_inverse(m, data.data());
    std::vector<double> factor = given;
    SmMatrix* factored_in_place = new_tied(session(), shape, factor, 4, 4);
    ASSERT_EQ(fn().qxsmfact(factored_in_place, 1), SM_OK);
    ASSERT_EQ(invert(factored_in_place, kInPlace), SM_OK);
    expect_inverse(factored_in_place, factor.data());
  }
}

TEST_P(InversionStatesTest, solves_and_diagonals_see_the_inverse) {
  const Dense a = from_rows({{4, 2, 1}, {2, 5, 3}, {1, 3, 9}});
  SmMatrix* m = build(session(), kSymmetricRows, a);
  ASSERT_EQ(invert(m, kApart), SM_OK);
  const std::vector<double> b{1, 2, 3};
  std::vector<double> x(3);
  ASSERT_EQ(qxsminvmultv(m, b.data(), x.data(), 1), SM_OK);
  EXPECT_TRUE(near(product(a, x), b, 1e-13));
  EXPECT_EQ(fn().qxsmfact(m, 0), SM_INVERTED);
  double log_det = 0.0;
  EXPECT_EQ(fn().qxsmlogdet(m, &log_det), SM_OK);
  EXPECT_NEAR(log_det, static_cast<double>(log_determinant(a)), 1e-13);
}

}  // namespace
}  // namespace sm::test
