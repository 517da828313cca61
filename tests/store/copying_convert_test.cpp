// Copies across kinds and formats: qxsmconvert.
#include <gtest/gtest.h>

#include "cholesky/cholesky_support.hpp"
#include "store/filled.hpp"

namespace sm::test {
namespace {

bool same_shape(Shape a, Shape b) { return a.kind == b.kind && a.format == b.format; }

bool served(Shape from, Shape to) {
  switch (from.kind) {
    case SM_KIND_GENERAL:
      return to.kind == SM_KIND_GENERAL;
    case SM_KIND_SYMMETRIC:
      return to.kind != SM_KIND_DIAGONAL;
    default:
      return true;
  }
}

// What the target stores after a conversion: every stored value, at both places when only the target keeps both
// triangles.
Nonzeros converted(const Filled& a, Shape to) {
  if (same_shape(a.shape, to)) return a.stored;
  Nonzeros out;
  for (const auto& [place, value] : a.stored) {
    if (to.kind == SM_KIND_SYMMETRIC && is_sparse(to) && value == 0.0 && place.first != place.second) continue;
    out[place] = value;
    if (a.shape.kind == SM_KIND_SYMMETRIC && to.kind == SM_KIND_GENERAL) out[{place.second, place.first}] = value;
  }
  if (is_sparse(to)) return out;
  for (std::int64_t r = 0; r < a.dense.rows(); ++r)
    for (std::int64_t c = 0; c < a.dense.cols(); ++c)
      if (to.kind == SM_KIND_GENERAL || (to.kind == SM_KIND_SYMMETRIC && r <= c) || r == c)
        out.try_emplace({r, c}, 0.0);
  return out;
}

class Convert : public ModuleTest {
 protected:
  SmMatrix* typed(Shape shape) {
    SmMatrix* m = nullptr;
    EXPECT_EQ(fn().qxsmnew(instance(), &m, shape.kind, shape.format), SM_OK);
    return m;
  }
  void expect_converted(const Filled& a, Shape to, SmMatrix* target) {
    SCOPED_TRACE(name_of(a.shape) + " to " + name_of(to));
    ASSERT_EQ(fn().qxsmconvert(a.matrix, target, 0), SM_OK);
    EXPECT_EQ(target->rows, a.dense.rows());
    EXPECT_EQ(target->cols, a.dense.cols());
    EXPECT_EQ(target->kind, to.kind);
    EXPECT_EQ(target->format, to.format);
    EXPECT_EQ(entries(target), converted(a, to));
    EXPECT_TRUE(same(contents(target), a.dense));
    if (same_shape(a.shape, to)) return;
    EXPECT_EQ(target->state, SM_STATE_CLOSED);
    EXPECT_EQ(target->definite, -1);
    expect_voided(target);
  }
};

TEST_P(Convert, every_pair_of_shapes_is_converted_or_answers_124_with_the_target_sized) {
  Random random(1);
  for (const Shape from : kShapes) {
    for (const Shape to : kShapes) {
      for (const std::int64_t n : {1, 2, 11}) {
        const Filled a = filled(session(), from, n, n, random);
        SmMatrix* target = typed(to);
        if (served(from, to)) {
          expect_converted(a, to, target);
        } else {
          EXPECT_EQ(fn().qxsmconvert(a.matrix, target, 0), SM_UNAVAILABLE) << name_of(from) << " to " << name_of(to);
          EXPECT_EQ(target->rows, n);
          EXPECT_TRUE(same(contents(target), Dense(n, n)));
        }
        EXPECT_EQ(entries(a.matrix), a.stored) << "the source stays";
        EXPECT_EQ(a.matrix->state, SM_STATE_CLOSED);
      }
    }
  }
}

TEST_P(Convert, general_matrices_of_any_size_change_their_format) {
  Random random(2);
  const Shape general[] = {kGeneralSparse, kGeneralColumns, kGeneralRows};
  for (const Shape from : general)
    for (const Shape to : general) {
      SmMatrix* target = typed(to);
      expect_converted(filled(session(), from, 3, 8, random), to, target);
      expect_converted(filled(session(), from, 8, 3, random), to, target);
      expect_converted(filled(session(), from, 1, 500, random), to, target);
      expect_converted(filled(session(), from, 30, 1, random), to, target);
    }
}

TEST_P(Convert, a_matrix_that_is_not_square_answers_111_before_124) {
  Random random(3);
  for (const Shape from : {kGeneralSparse, kGeneralColumns, kGeneralRows}) {
    const Filled a = filled(session(), from, 3, 4, random);
    for (const Shape to : {kSymmetricSparse, kSymmetricColumns, kSymmetricRows, kDiagonalColumns, kDiagonalRows}) {
      EXPECT_EQ(fn().qxsmconvert(a.matrix, typed(to), 0), SM_NOT_SQUARE) << name_of(from) << " to " << name_of(to);
    }
    EXPECT_EQ(entries(a.matrix), a.stored);
  }
}

TEST_P(Convert, the_flag_is_that_of_a_copy_and_means_nothing_otherwise) {
  Random random(4);
  const Filled a = filled_definite(session(), kSymmetricSparse, 12, random);
  ASSERT_EQ(fn().qxsmfact(a.matrix, 0), SM_OK);
  SmMatrix* copy = typed(kSymmetricSparse);
  ASSERT_EQ(fn().qxsmconvert(a.matrix, copy, 0), SM_OK);
  EXPECT_EQ(copy->state, SM_STATE_FACTORED);
  EXPECT_TRUE(near(solved_identity(copy), inverse(a.dense), 1e-9));
  ASSERT_EQ(fn().qxsmconvert(a.matrix, copy, 1), SM_OK);
  EXPECT_EQ(copy->state, SM_STATE_OPEN);
  EXPECT_EQ(entries(copy), a.stored);
  for (const Shape from : kShapes)
    for (const Shape to : kShapes) {
      if (!served(from, to) || same_shape(from, to)) continue;
      const Filled b = filled(session(), from, 5, 5, random);
      SmMatrix* target = typed(to);
      ASSERT_EQ(fn().qxsmconvert(b.matrix, target, 1), SM_OK) << name_of(from) << " to " << name_of(to);
      EXPECT_EQ(target->state, SM_STATE_CLOSED);
      EXPECT_EQ(entries(target), converted(b, to));
    }
}

TEST_P(Convert, a_reordered_source_is_entered_in_the_callers_order) {
  Random random(5);
  for (std::int32_t state = SM_STATE_ORDERED; state <= SM_STATE_FACTORED; ++state) {
    for (const Shape to : {kGeneralSparse, kGeneralColumns, kGeneralRows, kSymmetricColumns, kSymmetricRows}) {
      const Filled a = filled_definite(session(), kSymmetricSparse, 20, random);
      ASSERT_EQ(bring_to(a.matrix, state), SM_OK);
      SCOPED_TRACE(state);
      expect_converted(a, to, typed(to));
      EXPECT_EQ(a.matrix->state, state);
      EXPECT_TRUE(same(dense_of_rows(a.matrix), a.dense));
    }
  }
}

TEST_P(Convert, a_factored_or_inverted_source_gives_its_values_and_no_factor) {
  Random random(6);
  for (const Shape from : kSquareFactored)
    for (const Shape to : kShapes) {
      if (!served(from, to) || same_shape(from, to)) continue;
      const Filled a = filled_definite(session(), from, 5, random);
      SmMatrix* target = typed(to);
      ASSERT_EQ(fn().qxsmfact(a.matrix, 0), SM_OK);
      expect_converted(a, to, target);
      ASSERT_EQ(fn().qxsminv(a.matrix, 0, kNan), SM_OK);
      expect_converted(a, to, target);
      EXPECT_EQ(a.matrix->state, SM_STATE_INVERTED);
      if (!is_sparse(to)) {
        EXPECT_EQ(target->dense_factor, nullptr);
      }
    }
}

TEST_P(Convert, zeros_are_entered_and_only_closing_drops_them) {
  for (const Shape from : {kSymmetricColumns, kSymmetricRows}) {
    const Filled a = filled_with(session(), from, 4, 4, {{{0, 0}, 1.0}, {{1, 3}, -0.0}, {{2, 3}, 5.0}});
    SmMatrix* trees = typed(kGeneralSparse);
    ASSERT_EQ(fn().qxsmconvert(a.matrix, trees, 0), SM_OK);
    EXPECT_EQ(trees->nnz, 16);
    EXPECT_EQ(bits(entries(trees).at({3, 1})), bits(-0.0));
    SmMatrix* rows = typed(kSymmetricSparse);
    ASSERT_EQ(fn().qxsmconvert(a.matrix, rows, 0), SM_OK);
    EXPECT_EQ(compressed(rows), (Nonzeros{{{0, 0}, 1.0}, {{1, 1}, 0.0}, {{2, 2}, 0.0}, {{2, 3}, 5.0}, {{3, 3}, 0.0}}));
  }
  SmMatrix* trees = typed(kGeneralSparse);
  ASSERT_EQ(fn().qxsmconvert(filled_with(session(), kGeneralRows, 2, 3, {{{0, 1}, 4.0}}).matrix, trees, 0), SM_OK);
  EXPECT_EQ(trees->nnz, 6);
  ASSERT_EQ(fn().qxsmconvert(filled_with(session(), kDiagonalRows, 3, 3, {{{1, 1}, 4.0}}).matrix, trees, 0), SM_OK);
  EXPECT_EQ(trees->nnz, 3) << "of a diagonal matrix the diagonal only";
}

TEST_P(Convert, tiny_values_infinities_and_nans_survive_closing) {
  const Filled a =
      filled_with(session(), kSymmetricRows, 3, 3, {{{0, 1}, 5e-324}, {{0, 2}, kNan}, {{1, 2}, -kInfinity}});
  SmMatrix* rows = typed(kSymmetricSparse);
  ASSERT_EQ(fn().qxsmconvert(a.matrix, rows, 0), SM_OK);
  const Nonzeros got = compressed(rows);
  EXPECT_EQ(got.size(), 6U);
  EXPECT_EQ(got.at({0, 1}), 5e-324);
  EXPECT_NE(got.at({0, 2}), got.at({0, 2}));
  EXPECT_EQ(got.at({1, 2}), -kInfinity);
}

TEST_P(Convert, a_target_loses_all_that_it_held) {
  Random random(7);
  for (const Shape from : kShapes)
    for (const Shape to : kShapes) {
      if (!served(from, to) || same_shape(from, to)) continue;
      SmMatrix* target =
          (to.kind == SM_KIND_GENERAL ? filled(session(), to, 9, 9, random) : filled_definite(session(), to, 9, random))
              .matrix;
      if (to.kind != SM_KIND_GENERAL) {
        ASSERT_EQ(fn().qxsmfact(target, 0), SM_OK);
      }
      expect_converted(filled(session(), from, 5, 5, random), to, target);
      expect_converted(filled(session(), from, 5, 5, random), to, target);
    }
}

TEST_P(Convert, a_tied_target_of_the_same_size_is_written_where_it_is) {
  Random random(8);
  std::vector<double> mine(6, -1.0);
  SmMatrix* target = new_open_tied(session(), mine, 3, 3, SM_KIND_SYMMETRIC, SM_FORMAT_ROWS);
  const Filled a = filled(session(), kSymmetricSparse, 3, 3, random);
  expect_converted(a, kSymmetricRows, target);
  for (const auto& [place, value] : a.stored) {
    EXPECT_EQ(mine[at(packed_position(3, SM_FORMAT_ROWS, place.first, place.second))], value);
  }
  const std::vector<double> before = mine;
  expect_converted(filled(session(), kSymmetricColumns, 4, 4, random), kSymmetricRows, target);
  EXPECT_EQ(mine, before) << "another size lets go of it";
}

TEST_P(Convert, an_empty_source_gives_an_empty_target) {
  Random random(9);
  for (const Shape from : kShapes)
    for (const Shape to : kShapes) {
      SmMatrix* source = new_sized(session(), from, 0, 0);
      ASSERT_EQ(fn().qxsmclose(source, 0.0), SM_OK);
      SmMatrix* target = filled(session(), to, 3, 3, random).matrix;
      EXPECT_EQ(fn().qxsmconvert(source, target, 0), served(from, to) ? SM_OK : SM_UNAVAILABLE)
          << name_of(from) << " to " << name_of(to);
      EXPECT_EQ(target->rows, 0);
      EXPECT_EQ(target->nnz, 0);
      if (served(from, to)) {
        EXPECT_EQ(target->state, SM_STATE_CLOSED) << name_of(from) << " to " << name_of(to);
      }
    }
  SmMatrix* trees = new_sized(session(), kGeneralSparse, 2, 5);
  SmMatrix* target = filled(session(), kGeneralRows, 3, 3, random).matrix;
  EXPECT_EQ(fn().qxsmconvert(trees, target, 0), SM_OK);
  EXPECT_TRUE(same(contents(target), Dense(2, 5)));
}

TEST_P(Convert, the_same_record_twice_answers_0_and_stays) {
  Random random(10);
  SmMatrix* none = new_untyped(session());
  EXPECT_EQ(fn().qxsmconvert(none, none, 0), SM_OK);
  for (const Shape shape : kShapes) {
    const Filled a = filled(session(), shape, 4, 4, random);
    const Unclosed open = unclosed(session(), shape);
    const Nonzeros before = entries(open.matrix);
    for (const std::int32_t flag : {0, 1}) {
      EXPECT_EQ(fn().qxsmconvert(a.matrix, a.matrix, flag), SM_OK);
      EXPECT_EQ(entries(a.matrix), a.stored) << name_of(shape);
      EXPECT_EQ(a.matrix->state, SM_STATE_CLOSED);
      EXPECT_EQ(fn().qxsmconvert(open.matrix, open.matrix, flag), SM_OK);
      EXPECT_EQ(entries(open.matrix), before) << name_of(shape);
      EXPECT_EQ(open.matrix->state, SM_STATE_OPEN);
    }
  }
}

TEST_P(Convert, the_kind_and_state_of_the_source_are_checked_before_the_target_is_touched) {
  Random random(11);
  const Filled kept = filled(session(), kGeneralColumns, 3, 4, random);
  EXPECT_EQ(fn().qxsmconvert(new_untyped(session()), kept.matrix, 0), SM_UNTYPED);
  EXPECT_EQ(fn().qxsmconvert(new_untyped_with_an_entry(session()), kept.matrix, 0), SM_UNTYPED);
  EXPECT_EQ(fn().qxsmconvert(new_untyped(session()), new_untyped(session()), 0), SM_UNTYPED);
  for (const Shape shape : kShapes) {
    const Unclosed open = unclosed(session(), shape);
    EXPECT_EQ(fn().qxsmconvert(open.matrix, kept.matrix, 0), SM_NOT_CLOSED) << name_of(shape);
    EXPECT_EQ(fn().qxsmconvert(open.matrix, new_untyped(session()), 0), SM_NOT_CLOSED) << name_of(shape);
    const Filled a = filled(session(), shape, 3, 3, random);
    EXPECT_EQ(fn().qxsmconvert(a.matrix, new_untyped(session()), 0), SM_UNTYPED) << "the answer of sizing the target";
  }
  EXPECT_EQ(fn().qxsmconvert(new_without_rows(session(), 3), kept.matrix, 0), SM_NOT_CLOSED);
  EXPECT_EQ(entries(kept.matrix), kept.stored);
}

INSTANTIATE_BOTH_HOSTS(Convert);

}  // namespace
}  // namespace sm::test
