// Copies of general, packed and diagonal matrices, and what is refused: qxsmclone.
#include <gtest/gtest.h>

#include "cholesky/cholesky_support.hpp"
#include "store/filled.hpp"

namespace sm::test {
namespace {

constexpr Shape kAllButSymmetricSparse[] = {kGeneralSparse, kGeneralColumns,  kGeneralRows, kSymmetricColumns,
                                            kSymmetricRows, kDiagonalColumns, kDiagonalRows};

class CloneValues : public ModuleTest {
 protected:
  SmMatrix* typed(Shape shape) {
    SmMatrix* m = nullptr;
    EXPECT_EQ(fn().qxsmnew(instance(), &m, shape.kind, shape.format), SM_OK);
    return m;
  }
  void expect_copy(const Filled& a, SmMatrix* copy) {
    EXPECT_EQ(entries(copy), a.stored) << name_of(a.shape);
    EXPECT_EQ(copy->rows, a.dense.rows());
    EXPECT_EQ(copy->cols, a.dense.cols());
    EXPECT_EQ(copy->nnz, a.matrix->nnz);
    EXPECT_EQ(copy->value_count, a.matrix->value_count);
    EXPECT_EQ(copy->state, SM_STATE_CLOSED) << name_of(a.shape);
    EXPECT_EQ(copy->definite, -1);
    expect_voided(copy);
    EXPECT_NE(copy->values, a.matrix->values);
  }
};

TEST_P(CloneValues, every_shape_and_size_is_copied_whatever_the_flag_says) {
  Random random(1);
  for (const Shape shape : kAllButSymmetricSparse) {
    for (const std::int32_t flag : {0, 1}) {
      for (const std::int64_t n : {1, 3, 14}) {
        const Filled a = filled(session(), shape, n, n, random);
        SmMatrix* copy = typed(shape);
        ASSERT_EQ(fn().qxsmclone(a.matrix, copy, flag), SM_OK) << name_of(shape);
        expect_copy(a, copy);
      }
    }
  }
  for (const Shape shape : {kGeneralSparse, kGeneralColumns, kGeneralRows}) {
    const Filled a = filled(session(), shape, 3, 8, random);
    SmMatrix* copy = typed(shape);
    ASSERT_EQ(fn().qxsmclone(a.matrix, copy, 0), SM_OK);
    expect_copy(a, copy);
    const Filled b = filled(session(), shape, 8, 3, random);
    ASSERT_EQ(fn().qxsmclone(b.matrix, copy, 0), SM_OK);
    expect_copy(b, copy);
  }
}

TEST_P(CloneValues, a_copy_and_its_source_are_apart) {
  Random random(2);
  for (const Shape shape : kAllButSymmetricSparse) {
    SCOPED_TRACE(name_of(shape));
    Filled a = filled(session(), shape, 5, 5, random);
    SmMatrix* copy = typed(shape);
    ASSERT_EQ(fn().qxsmclone(a.matrix, copy, 0), SM_OK);
    ASSERT_EQ(fn().qxsmassign(copy, 4, 4, 0, 1000.0), SM_OK);
    EXPECT_EQ(entries(a.matrix), a.stored);
    Nonzeros changed = a.stored;
    changed[{4, 4}] = 1000.0;
    ASSERT_EQ(fn().qxsmDestroyMatrix(instance(), &a.matrix), SM_OK);
    EXPECT_EQ(entries(copy), changed);
  }
}

TEST_P(CloneValues, a_copy_of_trees_takes_slabs_as_assembly_does_and_goes_on_growing) {
  Nonzeros elements;
  for (std::int64_t r = 0; r < 3; ++r)
    for (std::int64_t c = 0; c < 700; c += 1 + r) elements[{r, c}] = static_cast<double>(c - 300 * r);
  const Filled a = filled_with(session(), kGeneralSparse, 3, 700, elements);
  ASSERT_GT(a.matrix->nnz, 3 * a.matrix->slab_nodes);
  SmMatrix* copy = typed(kGeneralSparse);
  ASSERT_EQ(fn().qxsmclone(a.matrix, copy, 0), SM_OK);
  expect_copy(a, copy);
  EXPECT_EQ(copy->slab_used, a.matrix->slab_used);
  Nonzeros expected = a.stored;
  for (std::int64_t c = 0; c < 900; ++c) {
    ASSERT_EQ(fn().qxsmassign(copy, 30, c, 0, 1.0), SM_OK);
    expected[{30, c}] = 1.0;
  }
  EXPECT_EQ(entries(copy), expected);
  EXPECT_EQ(entries(a.matrix), a.stored);
}

TEST_P(CloneValues, a_copy_of_trees_ends_exactly_where_a_slab_does) {
  for (const std::int64_t over : {-1, 0, 1}) {
    Nonzeros elements;
    for (std::int64_t c = 0; c < 400 + over; ++c) elements[{0, c}] = 1.0;
    const Filled a = filled_with(session(), kGeneralSparse, 2, 500, elements);
    ASSERT_EQ(a.matrix->slab_nodes, 400);
    SmMatrix* copy = typed(kGeneralSparse);
    ASSERT_EQ(fn().qxsmclone(a.matrix, copy, 0), SM_OK);
    expect_copy(a, copy);
    EXPECT_EQ(copy->slab_used, a.matrix->slab_used);
    EXPECT_EQ(fn().qxsmassign(copy, 1, 450, 0, 2.0), SM_OK);
    EXPECT_EQ(copy->nnz, a.matrix->nnz + 1);
  }
}

TEST_P(CloneValues, a_copy_of_trees_with_removed_and_grown_rows_holds_what_is_left) {
  SmMatrix* source = filled_with(session(), kGeneralSparse, 3, 3, {{{0, 1}, 1.0}, {{2, 2}, 2.0}}).matrix;
  ASSERT_EQ(qxsmremove(source, 0, 1), SM_OK);
  ASSERT_EQ(fn().qxsmassign(source, 40, 5, 0, 3.0), SM_OK);
  SmMatrix* copy = typed(kGeneralSparse);
  ASSERT_EQ(fn().qxsmclone(source, copy, 0), SM_OK);
  EXPECT_EQ(entries(copy), (Nonzeros{{{2, 2}, 2.0}, {{40, 5}, 3.0}}));
  EXPECT_EQ(copy->rows, 41);
  EXPECT_EQ(copy->cols, 6);
}

TEST_P(CloneValues, a_factored_or_inverted_source_gives_its_values_and_no_factor) {
  Random random(3);
  for (const Shape shape : kSquareFactored) {
    SCOPED_TRACE(name_of(shape));
    const Filled a = filled_definite(session(), shape, 6, random);
    ASSERT_EQ(fn().qxsmfact(a.matrix, 0), SM_OK);
    SmMatrix* copy = typed(shape);
    ASSERT_EQ(fn().qxsmclone(a.matrix, copy, 0), SM_OK);
    expect_copy(a, copy);
    EXPECT_EQ(copy->dense_factor, nullptr);
    ASSERT_EQ(fn().qxsminv(a.matrix, 0, kNan), SM_OK);
    ASSERT_EQ(fn().qxsmclone(a.matrix, copy, 0), SM_OK);
    expect_copy(a, copy);
    EXPECT_EQ(copy->dense_factor, nullptr);
    EXPECT_EQ(a.matrix->state, SM_STATE_INVERTED) << "the source stays";
  }
}

TEST_P(CloneValues, a_copy_of_a_tied_matrix_owns_its_values) {
  std::vector<double> data{1.0, 2.0, 3.0, 4.0, 5.0, 6.0};
  SmMatrix* source = new_open_tied(session(), data, 2, 3, SM_KIND_GENERAL, SM_FORMAT_ROWS);
  SmMatrix* copy = typed(kGeneralRows);
  EXPECT_EQ(fn().qxsmclone(source, copy, 0), SM_NOT_CLOSED);
  ASSERT_EQ(fn().qxsmclose(source, kNan), SM_OK);
  ASSERT_EQ(fn().qxsmclone(source, copy, 0), SM_OK);
  EXPECT_EQ(copy->owns_values, 1);
  EXPECT_EQ(doubles(copy->values, 6), data);
}

TEST_P(CloneValues, values_are_copied_to_the_bit) {
  for (const Shape shape : kAllButSymmetricSparse) {
    const double odd[] = {-0.0, kNan, -kInfinity, 5e-324};
    Nonzeros elements;
    for (std::int64_t k = 0; k < 4; ++k) elements[{k, k}] = odd[at(k)];
    SmMatrix* source = filled_with(session(), shape, 4, 4, elements).matrix;
    SmMatrix* copy = typed(shape);
    ASSERT_EQ(fn().qxsmclone(source, copy, 0), SM_OK);
    const Nonzeros got = entries(copy);
    for (std::int64_t k = 0; k < 4; ++k)
      EXPECT_EQ(bits(got.at({k, k})), bits(odd[at(k)])) << name_of(shape) << ' ' << k;
  }
}

TEST_P(CloneValues, a_matrix_copied_onto_itself_stays_whatever_it_is) {
  Random random(4);
  for (const Shape shape : kShapes) {
    SCOPED_TRACE(name_of(shape));
    for (const std::int32_t flag : {0, 1}) {
      const Filled a = filled(session(), shape, 4, 4, random);
      const double* values = a.matrix->values;
      EXPECT_EQ(fn().qxsmclone(a.matrix, a.matrix, flag), SM_OK);
      EXPECT_EQ(a.matrix->values, values);
      EXPECT_EQ(entries(a.matrix), a.stored);
      EXPECT_EQ(a.matrix->state, SM_STATE_CLOSED);
      const Unclosed open = unclosed(session(), shape);
      const Nonzeros before = entries(open.matrix);
      EXPECT_EQ(fn().qxsmclone(open.matrix, open.matrix, flag), SM_OK);
      EXPECT_EQ(entries(open.matrix), before);
      EXPECT_EQ(open.matrix->state, SM_STATE_OPEN);
    }
  }
  SmMatrix* none = new_untyped(session());
  EXPECT_EQ(fn().qxsmclone(none, none, 0), SM_OK);
  SmMatrix* factored = filled_definite(session(), kSymmetricSparse, 4, random).matrix;
  ASSERT_EQ(fn().qxsmfact(factored, 0), SM_OK);
  EXPECT_EQ(fn().qxsmclone(factored, factored, 1), SM_OK);
  EXPECT_EQ(factored->state, SM_STATE_FACTORED);
}

TEST_P(CloneValues, the_kind_and_state_of_the_source_are_checked_before_the_target_is_touched) {
  Random random(5);
  const Filled kept = filled(session(), kGeneralColumns, 3, 4, random);
  kept.matrix->solver_word = 8;
  SmMatrix* none = new_untyped(session());
  EXPECT_EQ(fn().qxsmclone(none, kept.matrix, 0), SM_UNTYPED);
  EXPECT_EQ(fn().qxsmclone(none, new_untyped(session()), 0), SM_UNTYPED);
  for (const Shape shape : kShapes) {
    const Unclosed open = unclosed(session(), shape);
    open.matrix->solver_word = 9;
    EXPECT_EQ(fn().qxsmclone(open.matrix, kept.matrix, 0), SM_NOT_CLOSED) << name_of(shape);
    EXPECT_EQ(fn().qxsmclone(open.matrix, new_untyped(session()), 0), SM_NOT_CLOSED) << name_of(shape);
  }
  EXPECT_EQ(fn().qxsmclone(new_without_rows(session(), 3), kept.matrix, 0), SM_NOT_CLOSED);
  EXPECT_EQ(fn().qxsmclone(new_sized(session(), kSymmetricSparse, 3, 3), typed(kSymmetricSparse), 1), SM_NOT_CLOSED);
  EXPECT_EQ(entries(kept.matrix), kept.stored);
  EXPECT_EQ(kept.matrix->rows, 3);
  EXPECT_EQ(kept.matrix->solver_word, 8);
}

TEST_P(CloneValues, the_answer_of_sizing_the_target_comes_before_the_comparison_of_kinds) {
  Random random(6);
  const Filled wide = filled(session(), kGeneralRows, 2, 5, random);
  wide.matrix->solver_word = 77;
  for (const Shape shape : {kSymmetricSparse, kSymmetricColumns, kSymmetricRows, kDiagonalColumns, kDiagonalRows}) {
    SmMatrix* target = typed(shape);
    EXPECT_EQ(fn().qxsmclone(wide.matrix, target, 0), SM_NOT_SQUARE) << name_of(shape);
    EXPECT_EQ(target->solver_word, 77) << "taken over first";
  }
  EXPECT_EQ(fn().qxsmclone(wide.matrix, new_untyped(session()), 0), SM_UNTYPED);
  EXPECT_EQ(entries(wide.matrix), wide.stored);
}

TEST_P(CloneValues, every_pair_of_different_kinds_or_formats_answers_110_with_the_target_sized) {
  Random random(7);
  for (const Shape from : kShapes) {
    const Filled a = filled(session(), from, 4, 4, random);
    a.matrix->solver_word = 5;
    for (const Shape to : kShapes) {
      if (from.kind == to.kind && from.format == to.format) continue;
      SmMatrix* target = new_sized(session(), to, 2, 2);
      EXPECT_EQ(fn().qxsmclone(a.matrix, target, 0), SM_KIND_MISMATCH) << name_of(from) << " to " << name_of(to);
      EXPECT_EQ(target->rows, 4);
      EXPECT_EQ(target->cols, 4);
      EXPECT_EQ(target->solver_word, 5);
      EXPECT_TRUE(same(contents(target), Dense(4, 4))) << name_of(from) << " to " << name_of(to);
    }
    EXPECT_EQ(entries(a.matrix), a.stored);
  }
}

TEST_P(CloneValues, an_empty_source_empties_a_target_of_any_kind) {
  Random random(8);
  SmMatrix* trees = new_sized(session(), kGeneralSparse, 3, 3);
  for (const Shape to : kShapes) {
    SmMatrix* target = filled(session(), to, 4, 4, random).matrix;
    trees->solver_word = 6;
    EXPECT_EQ(fn().qxsmclone(trees, target, 0), SM_OK) << name_of(to);
    EXPECT_EQ(target->rows, 3);
    EXPECT_EQ(target->solver_word, 6);
    EXPECT_TRUE(same(contents(target), Dense(3, 3))) << name_of(to);
  }
  for (const Shape from : kAllButSymmetricSparse) {
    SmMatrix* source = new_sized(session(), from, 0, 0);
    for (const Shape to : kShapes) {
      SmMatrix* target = filled(session(), to, 4, 4, random).matrix;
      EXPECT_EQ(fn().qxsmclone(source, target, 0), SM_OK) << name_of(from) << " to " << name_of(to);
      EXPECT_EQ(target->rows, 0);
      EXPECT_EQ(target->nnz, 0);
    }
  }
}

INSTANTIATE_BOTH_HOSTS(CloneValues);

}  // namespace
}  // namespace sm::test
