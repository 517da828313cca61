// The whole matrix as a dense array: qxsmdense.
#include <gtest/gtest.h>

#include "cholesky/cholesky_support.hpp"
#include "store/filled.hpp"

namespace sm::test {
namespace {

class DenseExtraction : public ModuleTest {
 protected:
  void expect_full(const Filled& a) {
    Output out(a.dense.rows() * a.dense.cols());
    EXPECT_EQ(fn().qxsmdense(a.matrix, out.data(), 2), SM_OK);
    EXPECT_EQ(out.values(), row_major(a.dense)) << name_of(a.shape) << ", state " << a.matrix->state;
  }
  // Mode 0 in the order of format 22, mode 1 in that of format 23.
  void expect_packed(const Filled& a) {
    for (const std::int16_t mode : {std::int16_t{0}, std::int16_t{1}}) {
      const std::int64_t n = a.dense.rows();
      std::vector<double> expected;
      for (std::int64_t outer = 0; outer < n; ++outer)
        for (std::int64_t inner = 0; inner < n; ++inner) {
          const std::int64_t r = mode == 0 ? inner : outer;
          const std::int64_t c = mode == 0 ? outer : inner;
          if (r <= c) expected.push_back(static_cast<double>(a.dense(r, c)));
        }
      Output out(n * (n + 1) / 2);
      EXPECT_EQ(fn().qxsmdense(a.matrix, out.data(), mode), SM_OK);
      EXPECT_EQ(out.values(), expected) << name_of(a.shape) << ", mode " << mode << ", state " << a.matrix->state;
    }
  }
};

constexpr std::int16_t kOtherModes[] = {-1, 3, 4, 21, 22, 23, INT16_MAX, INT16_MIN};

TEST_P(DenseExtraction, every_square_matrix_is_written_whole) {
  Random random(1);
  for (const Shape shape : kShapes) {
    for (const std::int64_t n : {1, 2, 5, 19}) {
      const Filled a = filled(session(), shape, n, n, random);
      expect_full(a);
    }
  }
}

TEST_P(DenseExtraction, a_matrix_that_is_not_square_is_written_by_rows) {
  Random random(2);
  for (const Shape shape : {kGeneralSparse, kGeneralColumns, kGeneralRows}) {
    expect_full(filled(session(), shape, 3, 8, random));
    expect_full(filled(session(), shape, 8, 3, random));
    expect_full(filled(session(), shape, 1, 30, random));
    SmMatrix* m = filled_with(session(), shape, 2, 3, {{{0, 2}, 3.0}, {{1, 0}, 4.0}}).matrix;
    Output out(6);
    EXPECT_EQ(fn().qxsmdense(m, out.data(), 2), SM_OK);
    EXPECT_EQ(out.values(), (std::vector<double>{0.0, 0.0, 3.0, 4.0, 0.0, 0.0})) << name_of(shape);
  }
}

TEST_P(DenseExtraction, a_symmetric_matrix_is_packed_in_the_order_of_either_format) {
  Random random(3);
  for (const Shape shape : {kSymmetricSparse, kSymmetricColumns, kSymmetricRows}) {
    for (const std::int64_t n : {1, 2, 5, 19}) expect_packed(filled(session(), shape, n, n, random));
    SmMatrix* m = filled_with(session(), shape, 3, 3, {{{0, 1}, 2.0}, {{0, 2}, 3.0}, {{1, 2}, 5.0}}).matrix;
    Output columns(6);
    EXPECT_EQ(fn().qxsmdense(m, columns.data(), 0), SM_OK);
    EXPECT_EQ(columns.values(), (std::vector<double>{0.0, 2.0, 0.0, 3.0, 5.0, 0.0})) << name_of(shape);
    Output rows(6);
    EXPECT_EQ(fn().qxsmdense(m, rows.data(), 1), SM_OK);
    EXPECT_EQ(rows.values(), (std::vector<double>{0.0, 2.0, 3.0, 0.0, 5.0, 0.0})) << name_of(shape);
  }
}

TEST_P(DenseExtraction, a_diagonal_matrix_gives_its_values_when_it_is_packed) {
  for (const Shape shape : {kDiagonalColumns, kDiagonalRows}) {
    SmMatrix* m = filled_with(session(), shape, 3, 3, {{{0, 0}, 1.0}, {{1, 1}, -2.0}, {{2, 2}, 3.0}}).matrix;
    for (const std::int16_t mode : {std::int16_t{0}, std::int16_t{1}}) {
      Output out(3);
      EXPECT_EQ(fn().qxsmdense(m, out.data(), mode), SM_OK);
      EXPECT_EQ(out.values(), (std::vector<double>{1.0, -2.0, 3.0}));
    }
    Output full(9);
    EXPECT_EQ(fn().qxsmdense(m, full.data(), 2), SM_OK);
    EXPECT_EQ(full.values(), (std::vector<double>{1.0, 0.0, 0.0, 0.0, -2.0, 0.0, 0.0, 0.0, 3.0}));
  }
}

TEST_P(DenseExtraction, a_sparse_symmetric_matrix_is_written_in_the_callers_order_in_every_state) {
  Random random(4);
  for (std::int32_t state = SM_STATE_CLOSED; state <= SM_STATE_FACTORED; ++state) {
    const Filled a = filled_definite(session(), kSymmetricSparse, 12, random);
    ASSERT_EQ(bring_to(a.matrix, state), SM_OK);
    expect_full(a);
    expect_packed(a);
  }
}

TEST_P(DenseExtraction, a_factored_or_inverted_matrix_shows_its_values) {
  Random random(5);
  for (const Shape shape : kSquareFactored) {
    const Filled a = filled_definite(session(), shape, 5, random);
    ASSERT_EQ(fn().qxsmfact(a.matrix, 0), SM_OK);
    expect_full(a);
    ASSERT_EQ(fn().qxsminv(a.matrix, 0, kNan), SM_OK);
    expect_full(a);
    if (shape.kind == SM_KIND_SYMMETRIC) expect_packed(a);
  }
}

TEST_P(DenseExtraction, a_matrix_that_grew_is_written_in_its_new_size) {
  SmMatrix* general = new_sized(session(), kGeneralSparse, 2, 2);
  ASSERT_EQ(fn().qxsmassign(general, 3, 5, 0, 7.0), SM_OK);
  Output out(24);
  EXPECT_EQ(fn().qxsmdense(general, out.data(), 2), SM_OK);
  std::vector<double> expected(24, 0.0);
  expected[23] = 7.0;
  EXPECT_EQ(out.values(), expected);
  Output cleared(24);
  EXPECT_EQ(fn().qxsmdense(general, cleared.data(), 0), SM_UNAVAILABLE);
  EXPECT_TRUE(cleared.cleared());

  SmMatrix* symmetric = new_sized(session(), kSymmetricSparse, 2, 2);
  ASSERT_EQ(fn().qxsmassign(symmetric, 0, 3, 0, 7.0), SM_OK);
  ASSERT_EQ(fn().qxsmclose(symmetric, 0.0), SM_OK);
  Output packed_rows(10);
  EXPECT_EQ(fn().qxsmdense(symmetric, packed_rows.data(), 1), SM_OK);
  std::vector<double> upper(10, 0.0);
  upper[3] = 7.0;
  EXPECT_EQ(packed_rows.values(), upper);
}

TEST_P(DenseExtraction, emptiness_kind_and_state_are_checked_before_the_output_is_touched) {
  Output out(9);
  for (const std::int16_t mode : {std::int16_t{2}, std::int16_t{9}}) {
    for (const Shape shape : kShapes) {
      EXPECT_EQ(fn().qxsmdense(new_sized(session(), shape, 0, 0), out.data(), mode), SM_OK) << name_of(shape);
      const Unclosed open = unclosed(session(), shape);
      EXPECT_EQ(fn().qxsmdense(open.matrix, out.data(), mode), SM_NOT_CLOSED) << name_of(shape);
    }
    EXPECT_EQ(fn().qxsmdense(new_sized(session(), kGeneralSparse, 3, 3), out.data(), mode), SM_OK);
    EXPECT_EQ(fn().qxsmdense(new_untyped(session()), out.data(), mode), SM_OK);
    EXPECT_EQ(fn().qxsmdense(new_untyped_with_an_entry(session()), out.data(), mode), SM_UNTYPED);
    EXPECT_EQ(fn().qxsmdense(new_without_rows(session(), 3), out.data(), mode), SM_NOT_CLOSED);
  }
  EXPECT_TRUE(out.untouched());
}

TEST_P(DenseExtraction, a_mode_that_is_not_served_answers_124_with_the_stored_form_cleared) {
  Random random(6);
  for (const Shape shape : kShapes) {
    SmMatrix* m = filled(session(), shape, 4, 4, random).matrix;
    const std::int64_t expected = shape.kind == SM_KIND_GENERAL ? 16 : shape.kind == SM_KIND_SYMMETRIC ? 10 : 4;
    ASSERT_EQ(m->value_count, static_cast<double>(expected));
    for (const std::int16_t mode : kOtherModes) {
      Output out(expected);
      EXPECT_EQ(fn().qxsmdense(m, out.data(), mode), SM_UNAVAILABLE) << name_of(shape) << ", mode " << mode;
      EXPECT_TRUE(out.cleared()) << name_of(shape);
    }
    if (shape.kind != SM_KIND_GENERAL) continue;
    for (const std::int16_t mode : {std::int16_t{0}, std::int16_t{1}}) {
      Output out(expected);
      EXPECT_EQ(fn().qxsmdense(m, out.data(), mode), SM_UNAVAILABLE) << name_of(shape) << ", mode " << mode;
      EXPECT_TRUE(out.cleared()) << name_of(shape);
    }
  }
}

TEST_P(DenseExtraction, more_elements_than_any_array_holds_answer_105_before_anything_is_cleared) {
  SmMatrix* m = new_sized(session(), kGeneralSparse, 2, SM_MAX_ELEMENTS);
  ASSERT_EQ(fn().qxsmassign(m, 1, SM_MAX_ELEMENTS - 1, 0, 1.0), SM_OK);
  Output out(8);
  for (const std::int16_t mode : {std::int16_t{2}, std::int16_t{0}, std::int16_t{9}}) {
    EXPECT_EQ(fn().qxsmdense(m, out.data(), mode), SM_TOO_LARGE) << mode;
  }
  ASSERT_EQ(fn().qxsmassign(m, 0, kHuge - 1, 0, 1.0), SM_OK);
  EXPECT_EQ(fn().qxsmdense(m, out.data(), 2), SM_TOO_LARGE) << "nor does a count past 64 bits fit";
  EXPECT_TRUE(out.untouched());
}

TEST_P(DenseExtraction, another_kind_answers_124) {
  Random random(7);
  SmMatrix* m = filled(session(), kGeneralRows, 3, 3, random).matrix;
  m->kind = 4;
  Output out(9);
  EXPECT_EQ(fn().qxsmdense(m, out.data(), 2), SM_UNAVAILABLE);
  EXPECT_TRUE(out.cleared());
  EXPECT_EQ(fn().qxsmdense(m, out.data(), 0), SM_UNAVAILABLE);
}

INSTANTIATE_BOTH_HOSTS(DenseExtraction);

}  // namespace
}  // namespace sm::test
