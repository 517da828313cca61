// A caller's values as the values of a matrix: qxsmcopyv.
#include <gtest/gtest.h>

#include "cholesky/cholesky_support.hpp"
#include "store/filled.hpp"

namespace sm::test {
namespace {

class Load : public ModuleTest {
 protected:
  SmStatus load(const double* values, SmMatrix* m, std::int64_t rows, std::int64_t cols, Shape shape) {
    return qxsmcopyv(values, m, rows, cols, shape.kind, shape.format);
  }
  // Values 1, 2, ... in storage order.
  static std::vector<double> counted(std::int64_t n) {
    std::vector<double> v;
    for (std::int64_t k = 0; k < n; ++k) v.push_back(static_cast<double>(k + 1));
    return v;
  }
  void expect_loaded(SmMatrix* m, const std::vector<double>& values, std::int64_t rows, std::int64_t cols,
                     Shape shape) {
    EXPECT_EQ(m->kind, shape.kind);
    EXPECT_EQ(m->format, shape.format);
    EXPECT_EQ(m->rows, rows);
    EXPECT_EQ(m->cols, cols);
    EXPECT_EQ(m->nnz, static_cast<std::int64_t>(values.size()));
    EXPECT_EQ(m->value_count, static_cast<double>(values.size()));
    ASSERT_NE(m->values, nullptr);
    EXPECT_EQ(doubles(m->values, m->nnz), values);
  }
};

TEST_P(Load, a_matrix_of_the_shape_takes_the_values_in_place) {
  for (const Shape shape : kDense) {
    const bool wide = shape.kind == SM_KIND_GENERAL;
    SmMatrix* m = new_sized(session(), shape, 4, wide ? 7 : 4);
    const double* array = m->values;
    const std::vector<double> values = counted(slots(shape, 4, wide ? 7 : 4));
    EXPECT_EQ(load(values.data(), m, 4, wide ? 7 : 4, shape), SM_OK) << name_of(shape);
    expect_loaded(m, values, 4, wide ? 7 : 4, shape);
    EXPECT_EQ(m->values, array);
    EXPECT_EQ(m->state, SM_STATE_CLOSED);
  }
}

TEST_P(Load, the_values_are_in_the_layout_of_the_format) {
  for (const Shape shape : kDense) {
    const std::vector<double> values = counted(slots(shape, 3, 3));
    SmMatrix* m = new_sized(session(), kGeneralSparse, 1, 1);
    ASSERT_EQ(load(values.data(), m, 3, 3, shape), SM_OK);
    for (std::int64_t r = 0; r < 3; ++r)
      for (std::int64_t c = 0; c < 3; ++c) {
        const std::int64_t slot = slot_of(shape, 3, 3, r, c);
        if (slot < 0) continue;
        double value = 0.0;
        EXPECT_EQ(fn().qxsmget(m, r, c, &value), SM_OK);
        EXPECT_EQ(value, values[at(slot)]) << name_of(shape) << ' ' << r << ' ' << c;
      }
  }
}

TEST_P(Load, every_matrix_becomes_every_dense_shape_in_its_own_record) {
  Random random(1);
  for (const Shape from : kShapes)
    for (const Shape to : kDense) {
      SCOPED_TRACE(name_of(from) + " to " + name_of(to));
      SmMatrix* m = filled(session(), from, 5, 5, random).matrix;
      m->solver_word = 3;
      const std::int64_t index = m->registry_index;
      const std::int64_t count = instance()->matrix_count;
      const std::int64_t pools = host().live_pools();
      const std::vector<double> values = counted(slots(to, 4, 4));
      EXPECT_EQ(load(values.data(), m, 4, 4, to), SM_OK);
      expect_loaded(m, values, 4, 4, to);
      EXPECT_EQ(m->state, SM_STATE_CLOSED);
      EXPECT_EQ(m->owns_values, 1);
      EXPECT_EQ(m->dense_factor, nullptr);
      EXPECT_EQ(m->registry_index, index);
      EXPECT_EQ(instance()->matrix_count, count);
      EXPECT_EQ(instance()->registry[index - 1], m);
      EXPECT_LE(host().live_pools(), pools);
    }
}

TEST_P(Load, each_of_kind_format_rows_and_columns_asks_for_a_new_matrix) {
  const std::vector<double> values = counted(6);
  SmMatrix* m = new_sized(session(), kGeneralRows, 2, 3);
  struct Wanted {
    std::int64_t rows, cols;
    Shape shape;
  };
  for (const Wanted& w :
       {Wanted{2, 3, kGeneralRows}, Wanted{2, 3, kGeneralColumns}, Wanted{3, 2, kGeneralColumns},
        Wanted{3, 3, kSymmetricColumns}, Wanted{3, 3, kSymmetricRows}, Wanted{6, 6, kDiagonalRows},
        Wanted{6, 6, kDiagonalColumns}, Wanted{6, 1, kGeneralColumns}, Wanted{1, 6, kGeneralColumns}}) {
    EXPECT_EQ(load(values.data(), m, w.rows, w.cols, w.shape), SM_OK) << name_of(w.shape);
    expect_loaded(m, values, w.rows, w.cols, w.shape);
    expect_voided(m);
  }
}

TEST_P(Load, loading_again_and_again_loses_no_pool_and_no_block) {
  for (const Shape from : {kSymmetricSparse, kGeneralSparse}) {
    const std::vector<double> values = counted(16);
    SmMatrix* m = new_sized(session(), from, 6, 6);
    std::int64_t pools = 0;
    std::int64_t blocks = 0;
    for (int k = 0; k < 5; ++k) {
      ASSERT_EQ(load(values.data(), m, 4, 4, k % 2 == 0 ? kGeneralRows : kGeneralColumns), SM_OK);
      if (k > 0) {
        EXPECT_EQ(host().live_pools(), pools);
        EXPECT_EQ(host().live_blocks(), blocks);
      }
      pools = host().live_pools();
      blocks = host().live_blocks();
    }
  }
}

TEST_P(Load, a_factored_matrix_of_the_shape_keeps_its_state_and_its_factor_and_voids_its_results) {
  Random random(2);
  for (const Shape shape : kSquareFactored) {
    SCOPED_TRACE(name_of(shape));
    const Filled a = filled_definite(session(), shape, 4, random);
    ASSERT_EQ(fn().qxsmfact(a.matrix, 0), SM_OK);
    const double* factor = a.matrix->dense_factor;
    const std::vector<std::uint64_t> before = bits(factor, a.matrix->nnz);
    const std::vector<double> values = counted(a.matrix->nnz);
    ASSERT_EQ(load(values.data(), a.matrix, 4, 4, shape), SM_OK);
    expect_loaded(a.matrix, values, 4, 4, shape);
    EXPECT_EQ(a.matrix->state, SM_STATE_FACTORED);
    expect_voided(a.matrix);
    EXPECT_EQ(a.matrix->dense_factor, factor);
    EXPECT_EQ(bits(factor, a.matrix->nnz), before);
    EXPECT_TRUE(near(solved_identity(a.matrix), inverse(a.dense), 1e-10)) << "the factor is that of the old values";
  }
}

TEST_P(Load, an_open_tied_matrix_of_the_shape_stays_open_and_is_written_where_it_is) {
  std::vector<double> mine(6, -1.0);
  SmMatrix* m = new_open_tied(session(), mine, 2, 3, SM_KIND_GENERAL, SM_FORMAT_ROWS);
  const std::vector<double> values = counted(6);
  ASSERT_EQ(load(values.data(), m, 2, 3, kGeneralRows), SM_OK);
  EXPECT_EQ(mine, values);
  EXPECT_EQ(m->state, SM_STATE_OPEN);
  EXPECT_EQ(m->owns_values, 0);
  ASSERT_EQ(load(values.data(), m, 3, 2, kGeneralRows), SM_OK);
  expect_loaded(m, values, 3, 2, kGeneralRows);
  EXPECT_NE(m->values, mine.data()) << "another shape lets go of it";
  EXPECT_EQ(m->owns_values, 1);
  EXPECT_EQ(m->state, SM_STATE_CLOSED);
}

TEST_P(Load, the_matrix_s_own_array_is_refused_when_it_would_be_given_back) {
  SmMatrix* m = filled_with(session(), kGeneralRows, 2, 3, {{{0, 0}, 1.0}, {{1, 2}, 6.0}}).matrix;
  const Nonzeros before = entries(m);
  EXPECT_EQ(load(m->values, m, 3, 2, kGeneralRows), SM_BAD_ARGUMENT);
  EXPECT_EQ(load(m->values, m, 2, 3, kGeneralColumns), SM_BAD_ARGUMENT);
  EXPECT_EQ(load(m->values, m, 1, 1, {4, SM_FORMAT_ROWS}), SM_BAD_ARGUMENT) << "before the kind is looked at";
  EXPECT_EQ(load(m->values, m, 3, 2, kGeneralSparse), SM_UNAVAILABLE) << "after format 21";
  EXPECT_EQ(entries(m), before);
  EXPECT_EQ(load(m->values, m, 2, 3, kGeneralRows), SM_OK);
  EXPECT_EQ(entries(m), before);
  std::vector<double> mine = counted(6);
  SmMatrix* tied = new_open_tied(session(), mine, 2, 3, SM_KIND_GENERAL, SM_FORMAT_ROWS);
  EXPECT_EQ(load(tied->values, tied, 3, 2, kGeneralRows), SM_OK) << "a tied one is not given back";
  expect_loaded(tied, counted(6), 3, 2, kGeneralRows);
}

TEST_P(Load, values_inside_an_array_that_would_be_given_back_are_refused_wherever_they_begin) {
  Random random(7);
  for (const Shape shape : kSquareFactored) {
    SCOPED_TRACE(name_of(shape));
    const Filled a = filled_definite(session(), shape, 4, random);
    ASSERT_EQ(fn().qxsmfact(a.matrix, 0), SM_OK);
    const std::int64_t count = a.matrix->nnz;
    const double* factor = a.matrix->dense_factor;
    for (const double* array : {static_cast<const double*>(a.matrix->values), factor})
      for (const std::int64_t from : {std::int64_t{0}, std::int64_t{1}, count - 1}) {
        EXPECT_EQ(load(array + from, a.matrix, 1, 1, kGeneralRows), SM_BAD_ARGUMENT) << from;
        EXPECT_EQ(load(array + from, a.matrix, 3, -3, {9, 99}), SM_BAD_ARGUMENT) << "before the type is looked at";
      }
    EXPECT_EQ(contents(a.matrix), a.stored);
    EXPECT_EQ(a.matrix->state, SM_STATE_FACTORED);
    EXPECT_EQ(a.matrix->rank, 4);
    EXPECT_EQ(a.matrix->dense_factor, factor);
  }
  const Filled sparse = filled_definite(session(), kSymmetricSparse, 4, random);
  ASSERT_EQ(fn().qxsmfact(sparse.matrix, 0), SM_OK);
  for (const double* p : {static_cast<const double*>(sparse.matrix->nz_values),
                          static_cast<const double*>(sparse.matrix->nz_values + sparse.matrix->nnz - 1),
                          static_cast<const double*>(sparse.matrix->factor_diag),
                          static_cast<const double*>(sparse.matrix->factor_values)}) {
    EXPECT_EQ(load(p, sparse.matrix, 1, 1, kGeneralRows), SM_BAD_ARGUMENT);
  }
  EXPECT_EQ(sparse.matrix->state, SM_STATE_FACTORED);
}

TEST_P(Load, a_factor_beside_a_tied_array_is_refused_and_the_tied_array_is_not) {
  std::vector<double> mine{4.0, 2.0, 5.0};
  SmMatrix* m = new_open_tied(session(), mine, 2, 2, SM_KIND_SYMMETRIC, SM_FORMAT_ROWS);
  ASSERT_EQ(fn().qxsmclose(m, kNan), SM_OK);
  ASSERT_EQ(fn().qxsmfact(m, 0), SM_OK);
  EXPECT_EQ(load(m->dense_factor, m, 3, 1, kGeneralRows), SM_BAD_ARGUMENT);
  EXPECT_EQ(load(mine.data() + 1, m, 2, 1, kGeneralRows), SM_OK);
  expect_loaded(m, {2.0, 5.0}, 2, 1, kGeneralRows);
}

TEST_P(Load, into_its_shape_a_matrix_takes_values_from_its_own_factor_and_from_an_overlapping_array) {
  SmMatrix* m = filled_with(session(), kDiagonalRows, 3, 3, {{{0, 0}, 4.0}, {{1, 1}, 9.0}, {{2, 2}, 16.0}}).matrix;
  ASSERT_EQ(fn().qxsmfact(m, 0), SM_OK);
  ASSERT_EQ(load(m->dense_factor, m, 3, 3, kDiagonalRows), SM_OK);
  expect_loaded(m, {2.0, 3.0, 4.0}, 3, 3, kDiagonalRows);
  for (const std::ptrdiff_t from : {0, 1, 2}) {
    std::vector<double> mine = counted(8);
    SmMatrix* tied = sized(session(), kGeneralRows, 1, 1);
    ASSERT_EQ(qxsmtie(tied, mine.data() + 1, 2, 3, SM_KIND_GENERAL, SM_FORMAT_ROWS), SM_OK);
    const std::vector<double> want(mine.begin() + from, mine.begin() + from + 6);
    ASSERT_EQ(load(mine.data() + from, tied, 2, 3, kGeneralRows), SM_OK);
    expect_loaded(tied, want, 2, 3, kGeneralRows);
    EXPECT_EQ(mine.front(), 1.0);
    EXPECT_EQ(mine.back(), 8.0);
  }
}

TEST_P(Load, null_values_come_before_everything_and_do_nothing) {
  Random random(3);
  for (const Shape shape : kShapes) {
    const Filled a = filled(session(), shape, 3, 3, random);
    for (const std::int32_t format : {21, 22, 23, 99}) {
      EXPECT_EQ(qxsmcopyv(nullptr, a.matrix, 7, -1, shape.kind, format), SM_OK) << name_of(shape);
    }
    EXPECT_EQ(entries(a.matrix), a.stored);
  }
  EXPECT_EQ(qxsmcopyv(nullptr, new_untyped(session()), 2, 2, SM_KIND_GENERAL, SM_FORMAT_ROWS), SM_OK);
  SmMatrix* factored = filled_definite(session(), kSymmetricRows, 3, random).matrix;
  ASSERT_EQ(fn().qxsmfact(factored, 0), SM_OK);
  EXPECT_EQ(qxsmcopyv(nullptr, factored, 3, 3, SM_KIND_SYMMETRIC, SM_FORMAT_ROWS), SM_OK);
  EXPECT_EQ(factored->rank, 3) << "nor is anything voided";
}

TEST_P(Load, the_sparse_format_answers_124_before_the_matrix_is_looked_at) {
  const std::vector<double> values = counted(9);
  Random random(4);
  for (const Shape shape : kShapes) {
    const Filled a = filled(session(), shape, 3, 3, random);
    for (const std::int32_t kind : {1, 2, 3, 6, 9}) {
      EXPECT_EQ(qxsmcopyv(values.data(), a.matrix, 3, -3, kind, SM_FORMAT_SPARSE), SM_UNAVAILABLE) << name_of(shape);
    }
    EXPECT_EQ(entries(a.matrix), a.stored);
  }
  EXPECT_EQ(load(values.data(), new_untyped(session()), 3, 3, kGeneralSparse), SM_UNAVAILABLE);
}

TEST_P(Load, a_record_of_kind_none_answers_1_before_kind_format_and_size_are_looked_at) {
  const std::vector<double> values = counted(9);
  SmMatrix* none = new_untyped(session());
  EXPECT_EQ(load(values.data(), none, 3, 3, kGeneralRows), SM_UNTYPED);
  EXPECT_EQ(load(values.data(), none, 3, -3, kGeneralRows), SM_UNTYPED);
  EXPECT_EQ(load(values.data(), none, 3, 3, {4, SM_FORMAT_ROWS}), SM_UNTYPED);
  EXPECT_EQ(load(values.data(), none, 3, 3, {SM_KIND_GENERAL, 24}), SM_UNTYPED);
  EXPECT_EQ(none->kind, SM_KIND_NONE);
}

TEST_P(Load, a_type_that_does_not_exist_leaves_a_record_of_kind_none) {
  const std::vector<double> values = counted(9);
  Random random(5);
  for (const Shape from : kShapes) {
    SCOPED_TRACE(name_of(from));
    SmMatrix* m = filled(session(), from, 3, 3, random).matrix;
    EXPECT_EQ(load(values.data(), m, 3, -3, {SM_KIND_GENERAL, 24}), SM_BAD_FORMAT) << "before the size is looked at";
    EXPECT_EQ(m->kind, SM_KIND_NONE);
    EXPECT_EQ(load(values.data(), m, 3, 3, kGeneralRows), SM_UNTYPED);
    m = filled(session(), from, 3, 3, random).matrix;
    EXPECT_EQ(load(values.data(), m, 3, -3, {5, SM_FORMAT_ROWS}), SM_UNAVAILABLE);
    EXPECT_EQ(m->kind, SM_KIND_NONE);
    EXPECT_EQ(m->nnz, 0);
  }
}

TEST_P(Load, a_size_that_is_refused_leaves_what_sizing_leaves) {
  const std::vector<double> values = counted(9);
  Random random(6);
  for (const Shape to : kDense) {
    SCOPED_TRACE(name_of(to));
    SmMatrix* m = filled(session(), kGeneralSparse, 3, 3, random).matrix;
    EXPECT_EQ(load(values.data(), m, 3, -3, to), SM_BAD_SIZE);
    EXPECT_EQ(load(values.data(), m, 0, 3, to), SM_BAD_SIZE);
    EXPECT_EQ(m->kind, to.kind);
    EXPECT_EQ(m->nnz, 0);
    if (to.kind != SM_KIND_GENERAL) {
      EXPECT_EQ(load(values.data(), m, 3, 2, to), SM_NOT_SQUARE);
      EXPECT_EQ(m->nnz, 0);
    }
    if (to.kind != SM_KIND_DIAGONAL) {
      EXPECT_EQ(load(values.data(), m, SM_MAX_ELEMENTS, SM_MAX_ELEMENTS, to), SM_TOO_LARGE);
      EXPECT_EQ(load(values.data(), m, SM_MAX_ELEMENTS, SM_MAX_ELEMENTS, to), SM_TOO_LARGE)
          << "sized again, not written";
    }
    EXPECT_EQ(load(values.data(), m, 3, 3, to), SM_OK);
    expect_loaded(m, counted(slots(to, 3, 3)), 3, 3, to);
  }
}

TEST_P(Load, nothing_is_loaded_into_0_by_0) {
  const std::vector<double> values = counted(1);
  for (const Shape to : kDense) {
    SmMatrix* m = new_sized(session(), to, 2, 2);
    EXPECT_EQ(load(values.data(), m, 0, 0, to), SM_OK) << name_of(to);
    EXPECT_EQ(m->nnz, 0);
    EXPECT_EQ(m->rows, 0);
    EXPECT_EQ(load(values.data(), m, 0, 0, to), SM_OK);
  }
}

TEST_P(Load, values_are_copied_to_the_bit) {
  const std::vector<double> odd{-0.0, kNan, -kInfinity, 5e-324};
  SmMatrix* m = new_sized(session(), kDiagonalRows, 4, 4);
  ASSERT_EQ(load(odd.data(), m, 4, 4, kDiagonalRows), SM_OK);
  EXPECT_EQ(bits(m->values, 4), bits(odd));
}

INSTANTIATE_BOTH_HOSTS(Load);

}  // namespace
}  // namespace sm::test
