// Reading and overwriting: qxsmget and qxsmsetee.
#include <gtest/gtest.h>

#include "store/store_test.hpp"
#include "support/random_matrices.hpp"

namespace sm::test {
namespace {

class Reading : public StoreTest {
 protected:
  // A closed matrix with entries in every row.
  SmMatrix* filled(Shape shape, std::int64_t n) {
    SmMatrix* m = square(shape, n);
    for (std::int64_t i = 0; i < n; ++i) EXPECT_EQ(set(m, i, i, 10.0 * static_cast<double>(i + 1)), SM_OK);
    for (std::int64_t i = 1; i < n && shape.kind != SM_KIND_DIAGONAL; ++i) {
      EXPECT_EQ(set(m, i - 1, i, static_cast<double>(i)), SM_OK);
    }
    EXPECT_EQ(fn().qxsmclose(m, 0.0), SM_OK);
    return m;
  }
};

TEST_P(Reading, an_empty_matrix_answers_123_and_zero_before_anything_else) {
  for (const Shape shape : kShapes) {
    SmMatrix* m = typed(shape);
    double value = 7.0;
    EXPECT_EQ(fn().qxsmget(m, -1, kHuge, &value), SM_NO_ELEMENT);
    EXPECT_EQ(bits(value), 0U);
  }
  SmMatrix* sized = make(kGeneralSparse, 3, 3);
  double value = 7.0;
  EXPECT_EQ(fn().qxsmget(sized, 0, 0, &value), SM_NO_ELEMENT);
  EXPECT_EQ(bits(value), 0U);
}

TEST_P(Reading, kind_comes_before_state_and_state_before_index) {
  SmMatrix* none = reset_record();
  none->nnz = 1;  // only a record that was tampered with has entries and no kind
  EXPECT_EQ(refused_at(none, -1, 0), SM_KIND_MISMATCH);
  EXPECT_EQ(fn().qxsmsetee(none, 1.0), SM_KIND_MISMATCH);
  none->nnz = 0;
  SmMatrix* open = square(kSymmetricSparse, 3);
  EXPECT_EQ(refused_at(open, 0, 0), SM_NOT_CLOSED);
  EXPECT_EQ(refused_at(open, -1, 9), SM_NOT_CLOSED);
  EXPECT_EQ(refused_at(open, 2, 1), SM_NOT_CLOSED);
  EXPECT_EQ(fn().qxsmsetee(open, 1.0), SM_NOT_CLOSED);
  EXPECT_EQ(walk(open, open->sym_roots).at({1, 1}), 0.0);
}

TEST_P(Reading, outside_the_matrix_comes_before_what_the_form_can_answer) {
  for (const Shape shape : kShapes) {
    SCOPED_TRACE(name_of(shape));
    SmMatrix* m = filled(shape, 4);
    for (const std::int64_t bad : {std::int64_t{-1}, std::int64_t{4}, SM_MAX_ELEMENTS, kHuge, -kHuge - 1}) {
      EXPECT_EQ(refused_at(m, bad, 0), SM_OUTSIDE) << bad;
      EXPECT_EQ(refused_at(m, 0, bad), SM_OUTSIDE) << bad;
      EXPECT_EQ(refused_at(m, bad, bad), SM_OUTSIDE) << bad;
    }
    EXPECT_EQ(refused_at(m, 5, 2), SM_OUTSIDE);
  }
}

TEST_P(Reading, a_matrix_that_is_not_square_has_its_own_bounds) {
  for (const Shape shape : {kGeneralSparse, kGeneralColumns, kGeneralRows}) {
    SmMatrix* m = make(shape, 2, 5);
    ASSERT_EQ(set(m, 1, 4, 3.0), SM_OK);
    EXPECT_EQ(at(m, 1, 4), 3.0);
    EXPECT_EQ(at(m, 0, 4), 0.0);
    EXPECT_EQ(refused_at(m, 2, 0), SM_OUTSIDE);
    EXPECT_EQ(refused_at(m, 1, 5), SM_OUTSIDE);
  }
}

TEST_P(Reading, a_symmetric_sparse_matrix_is_read_above_its_diagonal) {
  SmMatrix* m = square(kSymmetricSparse, 4);
  EXPECT_EQ(set(m, 2, 1, 5.0), SM_OUTSIDE);
  ASSERT_EQ(set(m, 1, 2, 5.0), SM_OK);
  ASSERT_EQ(fn().qxsmclose(m, 0.0), SM_OK);
  EXPECT_EQ(at(m, 1, 2), 5.0);
  EXPECT_EQ(refused_at(m, 2, 1), SM_NO_ELEMENT);
  EXPECT_EQ(at(m, 0, 3), 0.0);
  EXPECT_EQ(at(m, 1, 3), 0.0);
  EXPECT_EQ(at(m, 3, 3), 0.0);
}

TEST_P(Reading, every_column_of_a_compressed_row_is_found) {
  SmMatrix* m = square(kSymmetricSparse, 40);
  for (std::int64_t c = 5; c < 35; c += 3) ASSERT_EQ(set(m, 2, c, static_cast<double>(c)), SM_OK);
  ASSERT_EQ(set(m, 2, 2, -1.0), SM_OK);
  ASSERT_EQ(fn().qxsmclose(m, 0.0), SM_OK);
  EXPECT_EQ(at(m, 2, 2), -1.0);
  for (std::int64_t c = 3; c < 40; ++c) {
    EXPECT_EQ(at(m, 2, c), c >= 5 && c < 35 && (c - 5) % 3 == 0 ? static_cast<double>(c) : 0.0) << c;
  }
}

TEST_P(Reading, an_ordered_matrix_shows_its_diagonal_only) {
  SmMatrix* m = filled(kSymmetricSparse, 5);
  EXPECT_EQ(at(m, 1, 2), 2.0);
  const auto expect_diagonal_only = [&] {
    for (std::int64_t i = 0; i < 5; ++i) EXPECT_EQ(at(m, i, i), 10.0 * static_cast<double>(i + 1)) << i;
    EXPECT_EQ(refused_at(m, 1, 2), SM_NO_ELEMENT);
    EXPECT_EQ(refused_at(m, 2, 1), SM_NO_ELEMENT);
    EXPECT_EQ(refused_at(m, 0, 4), SM_NO_ELEMENT);
    EXPECT_EQ(refused_at(m, 5, 4), SM_OUTSIDE);
  };
  ASSERT_EQ(qxsmmd(m), SM_OK);
  expect_diagonal_only();
  ASSERT_EQ(qxsmreorder(m), SM_OK);
  expect_diagonal_only();
  ASSERT_EQ(fn().qxsmfact(m, 0), SM_OK);
  expect_diagonal_only();
}

TEST_P(Reading, a_packed_matrix_is_read_at_the_formulas_place_on_both_sides) {
  for (const Shape shape : kPacked) {
    SCOPED_TRACE(name_of(shape));
    const std::int64_t n = 5;
    SmMatrix* m = square(shape, n);
    for (std::int64_t k = 0; k < m->nnz; ++k) m->values[k] = static_cast<double>(k);
    for (std::int64_t r = 0; r < n; ++r) {
      for (std::int64_t c = 0; c < n; ++c) {
        // Below the diagonal there is no element; the formula is what is documented, not the mirrored element.
        const std::int64_t below =
            shape.format == SM_FORMAT_COLUMNS ? r + c * (c + 1) / 2 : (2 * n - r + 1) * r / 2 - r + c;
        const std::int64_t slot = r <= c ? slot_of(shape, n, n, r, c) : below;
        EXPECT_EQ(at(m, r, c), static_cast<double>(slot)) << r << ' ' << c;
      }
    }
  }
}

TEST_P(Reading, a_diagonal_matrix_answers_the_rows_value_for_any_column) {
  for (const Shape shape : {kDiagonalColumns, kDiagonalRows}) {
    SmMatrix* m = filled(shape, 3);
    for (std::int64_t r = 0; r < 3; ++r) {
      for (std::int64_t c = 0; c < 3; ++c) EXPECT_EQ(at(m, r, c), 10.0 * static_cast<double>(r + 1));
    }
  }
}

TEST_P(Reading, formats_and_kinds_that_do_not_exist_are_refused) {
  SmMatrix* m = filled(kGeneralRows, 3);
  m->format = 24;
  EXPECT_EQ(refused_at(m, 0, 0), SM_BAD_FORMAT);
  EXPECT_EQ(refused_at(m, 0, 3), SM_OUTSIDE);
  m->format = SM_FORMAT_ROWS;
  m->kind = 5;
  EXPECT_EQ(refused_at(m, 0, 0), SM_NO_ELEMENT);
  EXPECT_EQ(refused_at(m, 0, 3), SM_OUTSIDE);
  EXPECT_EQ(fn().qxsmsetee(m, 1.0), SM_UNAVAILABLE);
  m->kind = SM_KIND_GENERAL;
  EXPECT_EQ(at(m, 0, 0), 10.0);
}

TEST_P(Reading, setting_all_changes_values_and_no_pattern) {
  for (const Shape shape : kShapes) {
    SCOPED_TRACE(name_of(shape));
    SmMatrix* m = filled(shape, 4);
    const std::int64_t nnz = m->nnz;
    m->rank = 4;
    m->log_det = 2.0;
    EXPECT_EQ(fn().qxsmsetee(m, -2.5), SM_OK);
    EXPECT_EQ(m->nnz, nnz);
    expect_voided(m);
    EXPECT_EQ(m->state, SM_STATE_CLOSED);
    if (shape.kind == SM_KIND_GENERAL && is_sparse(shape)) {
      for (const auto& [place, value] : walk(m, m->row_roots)) EXPECT_EQ(value, -2.5);
    } else if (is_sparse(shape)) {
      for (const auto& [place, value] : compressed(m)) EXPECT_EQ(value, -2.5);
      EXPECT_EQ(at(m, 0, 3), 0.0);
    } else {
      for (std::int64_t k = 0; k < nnz; ++k) EXPECT_EQ(m->values[k], -2.5);
    }
  }
}

TEST_P(Reading, setting_all_of_nothing_does_nothing) {
  EXPECT_EQ(fn().qxsmsetee(reset_record(), 1.0), SM_OK);
  for (const Shape shape : kShapes) {
    SmMatrix* m = typed(shape);
    EXPECT_EQ(fn().qxsmsetee(m, 1.0), SM_OK);
    EXPECT_EQ(m->rank, -1);
  }
  SmMatrix* sized = make(kGeneralSparse, 3, 3);
  EXPECT_EQ(fn().qxsmsetee(sized, 1.0), SM_OK);
  EXPECT_EQ(sized->nnz, 0);
}

INSTANTIATE_BOTH_HOSTS(Reading);

}  // namespace
}  // namespace sm::test
