// qxsmAddGinv: what it refuses, and in which order.
#include "ginv/ginv_support.hpp"

namespace sm::test {
namespace {

using Index = std::int64_t;

class AdditionRefusalsTest : public ModuleTest {
 protected:
  SmMatrix* with(Shape shape, const Dense& a) { return build(session(), shape, a); }
  SmMatrix* open(const Dense& a) { return build_open(session(), a); }
  // A matrix that something can be added to.
  SmMatrix* target(Shape shape, const Dense& a) {
    return shape.kind == SM_KIND_SYMMETRIC && is_sparse(shape) ? open(a) : with(shape, a);
  }
  // Answers the status of a refusal that must leave G and B as they were, and P too.
  SmStatus refused(SmMatrix* g, SmMatrix* b, Index off = 0, SmMatrix* p = nullptr) {
    const Snapshot before_g = snapshot(g);
    const Snapshot before_b = snapshot(b);
    const Snapshot before_p = p ? snapshot(p) : Snapshot{};
    const SmStatus status = qxsmAddGinv(g, b, p, off, 2.0, 1e300);
    EXPECT_TRUE(snapshot(g) == before_g && snapshot(b) == before_b);
    if (p) {
      EXPECT_TRUE(snapshot(p) == before_p);
    }
    return status;
  }
};
INSTANTIATE_BOTH_HOSTS(AdditionRefusalsTest);

const Dense kTwo = from_diagonal({1, 2});

TEST_P(AdditionRefusalsTest, an_empty_target_is_done_before_any_check) {
  SmMatrix* b = with(kGeneralRows, kTwo);
  for (const Shape shape : kShapes) {
    SmMatrix* empty = new_sized(session(), shape, 0, 0);
    EXPECT_EQ(refused(empty, b, -1, b), SM_OK) << name_of(shape);
    EXPECT_EQ(refused(empty, empty, -1, empty), SM_OK);
  }
  SmMatrix* unfilled = new_sized(session(), kGeneralSparse, 4, 4);
  EXPECT_EQ(refused(unfilled, with(kGeneralSparse, kTwo)), SM_OK) << "a general matrix without entries takes none";
  SmMatrix* none = new_untyped(session());
  EXPECT_EQ(refused(none, none, -1, none), SM_OK);
}

TEST_P(AdditionRefusalsTest, two_handles_that_are_the_same_answer_104_before_the_kinds) {
  for (const Shape shape : kShapes) {
    SCOPED_TRACE(name_of(shape));
    SmMatrix* g = target(shape, kTwo);
    SmMatrix* other = with(shape.kind == SM_KIND_GENERAL ? kDiagonalRows : kGeneralSparse, kTwo);
    EXPECT_EQ(refused(g, g), SM_BAD_ARGUMENT);
    EXPECT_EQ(refused(g, other, 0, g), SM_BAD_ARGUMENT);
    EXPECT_EQ(refused(g, other, 0, other), SM_BAD_ARGUMENT);
    EXPECT_EQ(refused(g, g, 0, g), SM_BAD_ARGUMENT);
  }
  SmMatrix* closed = with(kSymmetricSparse, kTwo);
  EXPECT_EQ(refused(closed, closed), SM_BAD_ARGUMENT);  // and before the state
}

TEST_P(AdditionRefusalsTest, kinds_that_do_not_pair_answer_124) {
  for (const Shape g_shape : kShapes)
    for (const Shape b_shape : kShapes) {
      SCOPED_TRACE(name_of(g_shape) + ", " + name_of(b_shape));
      const bool general = g_shape.kind == SM_KIND_GENERAL && is_sparse(g_shape);
      bool served = general && b_shape.kind == SM_KIND_GENERAL && is_sparse(b_shape);
      if (g_shape.kind == SM_KIND_DIAGONAL) served = b_shape.kind == SM_KIND_DIAGONAL;
      if (g_shape.kind == SM_KIND_SYMMETRIC) served = b_shape.kind != SM_KIND_GENERAL;
      SmMatrix* g = target(g_shape, kTwo);
      SmMatrix* b = with(b_shape, kTwo);
      if (served) {
        EXPECT_EQ(refused(g, b, -1), SM_BAD_ARGUMENT);
        EXPECT_EQ(qxsmAddGinv(g, b, nullptr, 0, 2.0, 0.0), SM_OK);
        EXPECT_TRUE(near(contents(g), from_diagonal({3, 6}), 0.0));
      } else {
        EXPECT_EQ(refused(g, b), SM_UNAVAILABLE);
        EXPECT_EQ(refused(g, b, 0, new_untyped(session())), SM_UNAVAILABLE) << "before P is looked at";
        // A symmetric target looks at the place of the block first, the others at the kinds.
        const bool symmetric = g_shape.kind == SM_KIND_SYMMETRIC;
        EXPECT_EQ(refused(g, b, -1), symmetric ? SM_BAD_ARGUMENT : SM_UNAVAILABLE);
        EXPECT_EQ(refused(g, with(b_shape, from_diagonal({1, 2, 3}))),
                  symmetric ? SM_DIMENSION_MISMATCH : SM_UNAVAILABLE);
      }
    }
  for (const Shape g_shape : kShapes) {
    const SmStatus none_as_addend = refused(target(g_shape, kTwo), new_untyped(session()));
    EXPECT_EQ(none_as_addend, g_shape.kind == SM_KIND_SYMMETRIC ? SM_DIMENSION_MISMATCH : SM_UNAVAILABLE);
  }
  SmMatrix* none = new_untyped_with_an_entry(session());
  EXPECT_EQ(refused(none, with(kDiagonalRows, kTwo), -1), SM_UNAVAILABLE);
}

TEST_P(AdditionRefusalsTest, a_negative_offset_answers_104_before_the_order_and_the_states) {
  for (const Index off : {Index{-1}, std::numeric_limits<Index>::min()}) {
    EXPECT_EQ(refused(with(kGeneralSparse, kTwo), with(kGeneralSparse, kTwo), off), SM_BAD_ARGUMENT);
    for (const Shape g_shape : kDiagonalShapes) {
      EXPECT_EQ(refused(with(g_shape, kTwo), with(g_shape, kTwo), off), SM_BAD_ARGUMENT);
    }
    for (const Shape g_shape : kSymmetricShapes) {
      EXPECT_EQ(refused(with(g_shape, kTwo), open(from_diagonal({1, 2, 3})), off), SM_BAD_ARGUMENT) << name_of(g_shape);
    }
  }
}

TEST_P(AdditionRefusalsTest, a_diagonal_block_outside_the_target_answers_104) {
  for (const Shape shape : kDiagonalShapes)
    for (const Index off : {Index{2}, Index{3}, kHuge - 1, kHuge}) {
      SmMatrix* p = with(kDiagonalRows, kTwo);
      EXPECT_EQ(refused(with(shape, from_diagonal({1, 2, 3})), with(shape, kTwo), off, p), SM_BAD_ARGUMENT) << off;
    }
  EXPECT_EQ(refused(with(kDiagonalRows, kTwo), with(kDiagonalRows, from_diagonal({1, 2, 3}))), SM_BAD_ARGUMENT);
}

TEST_P(AdditionRefusalsTest, another_order_than_that_of_the_block_answers_121_before_the_states) {
  const Dense three = from_diagonal({1, 2, 3});
  for (const Shape g_shape : kSymmetricShapes)
    for (const Shape b_shape : {kSymmetricSparse, kSymmetricColumns, kSymmetricRows, kDiagonalColumns, kDiagonalRows})
      for (const Index off : {Index{0}, Index{2}, Index{3}, Index{4}, kHuge}) {
        SmMatrix* p = with(kGeneralRows, kTwo);
        SCOPED_TRACE(name_of(g_shape) + ", " + name_of(b_shape) + ' ' + std::to_string(off));
        EXPECT_EQ(refused(target(g_shape, three), with(b_shape, kTwo), off, p), SM_DIMENSION_MISMATCH);
        EXPECT_EQ(refused(with(g_shape, three), open(kTwo), off, p), SM_DIMENSION_MISMATCH);
      }
}

TEST_P(AdditionRefusalsTest, a_closed_sparse_target_answers_119_before_an_open_addend_113) {
  SmMatrix* p = with(kGeneralRows, kTwo);
  for (std::int32_t state = SM_STATE_CLOSED; state <= SM_STATE_FACTORED; ++state) {
    SmMatrix* closed = with(kSymmetricSparse, kTwo);
    ASSERT_EQ(bring_to(closed, state), SM_OK);
    EXPECT_EQ(refused(closed, open(kTwo), 0, p), SM_ALREADY_CLOSED);
    EXPECT_EQ(refused(closed, with(kSymmetricRows, kTwo), 0, p), SM_ALREADY_CLOSED);
  }
}

TEST_P(AdditionRefusalsTest, an_open_addend_answers_113_before_p_is_sized) {
  for (const Shape g_shape : kSymmetricShapes) {
    SCOPED_TRACE(name_of(g_shape));
    SmMatrix* p = with(kGeneralRows, kTwo);
    EXPECT_EQ(refused(target(g_shape, kTwo), open(kTwo), 0, p), SM_NOT_CLOSED);
    EXPECT_EQ(refused(target(g_shape, kTwo), open(kTwo), 0, new_untyped(session())), SM_NOT_CLOSED);
  }
  for (const Shape g_shape : kSymmetricShapes) {  // one of order 0 behind the end of G
    EXPECT_EQ(refused(target(g_shape, kTwo), open(Dense(0, 0)), 2), SM_NOT_CLOSED) << name_of(g_shape);
    SmMatrix* closed = open(Dense(0, 0));
    ASSERT_EQ(fn().qxsmclose(closed, 0.0), SM_OK);
    EXPECT_EQ(refused(target(g_shape, kTwo), closed, 2), SM_OK) << name_of(g_shape);
  }
  std::vector<double> data{1, 0, 2};
  SmMatrix* packed = new_open_tied(session(), data, 2, 2, SM_KIND_SYMMETRIC, SM_FORMAT_ROWS);
  EXPECT_EQ(refused(open(kTwo), packed), SM_NOT_CLOSED);
}

TEST_P(AdditionRefusalsTest, a_p_that_cannot_be_sized_or_written_leaves_g_as_it_was) {
  for (const Shape g_shape : kSymmetricShapes) {
    SCOPED_TRACE(name_of(g_shape));
    SmMatrix* g = target(g_shape, from_rows({{1, 3}, {3, 2}}));
    EXPECT_EQ(refused(g, with(kDiagonalRows, kTwo), 0, new_untyped(session())), SM_UNTYPED);
    const Snapshot before = snapshot(g);
    SmMatrix* diagonal = new_sized(session(), kDiagonalRows, 2, 2);
    EXPECT_EQ(qxsmAddGinv(g, with(kDiagonalRows, kTwo), diagonal, 0, 2.0, 0.0), SM_BAD_ARGUMENT);
    EXPECT_TRUE(snapshot(g) == before);
  }
  SmMatrix* g = with(kDiagonalRows, from_diagonal({1, 2, 3}));
  const Snapshot before = snapshot(g);
  SmMatrix* small = new_sized(session(), kDiagonalRows, 1, 1);
  EXPECT_EQ(qxsmAddGinv(g, with(kDiagonalRows, kTwo), small, 1, 2.0, 0.0), SM_BAD_ARGUMENT);
  EXPECT_TRUE(snapshot(g) == before);
}

TEST_P(AdditionRefusalsTest, a_general_entry_that_nothing_can_hold_is_told) {
  const Dense corner = from_rows({{0, 0}, {0, 5}});
  for (const Index off : {kHuge, kHuge - 1}) {
    SmMatrix* g = with(kGeneralSparse, kTwo);
    EXPECT_NE(refused(g, with(kGeneralSparse, corner), off), SM_OK) << off;
  }
  SmMatrix* g = with(kGeneralSparse, kTwo);
  EXPECT_EQ(refused(g, with(kGeneralSparse, from_rows({{5}})), kHuge), SM_TOO_LARGE);
}

TEST_P(AdditionRefusalsTest, an_addend_whose_values_could_not_be_had_changes_nothing) {
  for (const Shape b_shape : {kSymmetricColumns, kSymmetricRows, kDiagonalColumns, kDiagonalRows})
    for (const Shape g_shape : {kSymmetricSparse, kSymmetricColumns, kSymmetricRows, kDiagonalRows}) {
      if (g_shape.kind == SM_KIND_DIAGONAL && b_shape.kind != SM_KIND_DIAGONAL) continue;
      SmMatrix* g = target(g_shape, kTwo);
      SmMatrix* b = new_without_values(session(), b_shape, 2);
      const Dense before = contents(g);
      qxsmAddGinv(g, b, nullptr, 0, 2.0, 0.0);
      EXPECT_TRUE(near(contents(g), before, 0.0)) << name_of(g_shape) << ", " << name_of(b_shape);
    }
}

}  // namespace
}  // namespace sm::test
