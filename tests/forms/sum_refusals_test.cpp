// What the sum of two matrices answers when it cannot be had, in which order, and without memory: qxsmvaxpy.
#include <gtest/gtest.h>

#include "forms/forms_support.hpp"

namespace sm::test {
namespace {

class SumRefusals : public FormsTest {
 protected:
  SmMatrix* some(Shape shape, std::int64_t rows = 4, std::int64_t cols = 4) {
    Random random(1);
    return build(shape, random_known(random, shape, rows, cols));
  }
  SmMatrix* open(Shape shape) {
    SmMatrix* m = some(shape);
    if (shape == kSymmetricSparse) {
      m = sized(kSymmetricSparse, 4);
    } else {
      m->state = SM_STATE_OPEN;  // as a reset record that was tied is
    }
    return m;
  }
  // The status of a call that must leave the result as it is.
  SmStatus refused(SmMatrix* c, SmMatrix* a, SmMatrix* b) {
    const Known before = read(c);
    const std::int32_t state = c->state;
    const std::int64_t word = c->solver_word;
    const SmStatus status = fn().qxsmvaxpy(c, a, b, 2.0, 0.0);
    EXPECT_TRUE(same_entries(read(c), before)) << "status " << status;
    EXPECT_EQ(c->state, state);
    EXPECT_EQ(c->solver_word, word);
    return status;
  }
};

TEST_P(SumRefusals, a_result_that_is_the_second_operand_answers_104_before_anything_else) {
  for (const Shape shape : kShapes) {
    SmMatrix* b = some(shape);
    for (const Shape other : kShapes) {
      EXPECT_EQ(refused(b, some(other), b), SM_BAD_ARGUMENT) << name_of(shape) << ", " << name_of(other);
      EXPECT_EQ(refused(b, some(other, 7, 7), b), SM_BAD_ARGUMENT) << "before the shapes are compared";
      EXPECT_EQ(refused(b, open(other), b), SM_BAD_ARGUMENT) << "before the state is looked at";
    }
    EXPECT_EQ(refused(b, new_untyped(session()), b), SM_BAD_ARGUMENT) << "before the kind is looked at";
    EXPECT_EQ(refused(b, b, b), SM_BAD_ARGUMENT) << "all three the same: " << name_of(shape);
  }
  SmMatrix* none = new_untyped(session());
  EXPECT_EQ(refused(none, some(kGeneralRows), none), SM_BAD_ARGUMENT);
}

TEST_P(SumRefusals, any_of_kind_none_answers_1_before_the_state_is_looked_at) {
  for (const Shape shape : kShapes) {
    SmMatrix* none = new_untyped(session());
    EXPECT_EQ(refused(some(shape), none, some(shape)), SM_UNTYPED) << name_of(shape);
    EXPECT_EQ(refused(some(shape), some(shape), none), SM_UNTYPED) << name_of(shape);
    EXPECT_EQ(refused(none, some(shape), some(shape)), SM_UNTYPED) << name_of(shape);
    EXPECT_EQ(refused(some(shape), none, open(shape)), SM_UNTYPED) << name_of(shape);
    EXPECT_EQ(refused(some(shape), open(shape), none), SM_UNTYPED) << name_of(shape);
    EXPECT_EQ(refused(none, open(shape), some(shape, 7, 7)), SM_UNTYPED) << name_of(shape);
  }
}

TEST_P(SumRefusals, an_open_operand_answers_113_before_the_shapes_are_compared) {
  for (const Shape shape : kShapes)
    for (const Shape other : kShapes) {
      EXPECT_EQ(refused(some(shape), open(shape), some(other, 7, 7)), SM_NOT_CLOSED)
          << name_of(shape) << ", " << name_of(other);
      EXPECT_EQ(refused(some(shape), some(other, 7, 7), open(shape)), SM_NOT_CLOSED)
          << name_of(other) << ", " << name_of(shape);
    }
  SmMatrix* stripped = sized(kSymmetricSparse, 4);
  ASSERT_EQ(fn().qxsmresize(stripped, 4, 5), SM_NOT_SQUARE);
  EXPECT_EQ(refused(some(kSymmetricRows), stripped, some(kSymmetricRows)), SM_NOT_CLOSED);
  EXPECT_EQ(refused(some(kSymmetricRows), some(kSymmetricRows), stripped), SM_NOT_CLOSED);
  EXPECT_EQ(fn().qxsmvaxpy(open(kSymmetricSparse), some(kSymmetricSparse), some(kSymmetricSparse), 1.0, 0.0), SM_OK)
      << "the result may be open";
}

TEST_P(SumRefusals, shapes_that_differ_answer_121_before_the_result_is_touched) {
  for (const Shape sa : kShapes)
    for (const Shape sb : kShapes) {
      EXPECT_EQ(refused(some(kSymmetricRows, 9, 9), some(sa), some(sb, 5, 5)), SM_DIMENSION_MISMATCH)
          << name_of(sa) << ", " << name_of(sb);
    }
  for (const Shape sa : kGeneralShapes) {
    EXPECT_EQ(refused(some(kGeneralSparse), some(sa, 3, 4), some(kGeneralSparse, 3, 5)), SM_DIMENSION_MISMATCH);
    EXPECT_EQ(refused(some(kGeneralSparse), some(sa, 3, 4), some(kGeneralSparse, 2, 4)), SM_DIMENSION_MISMATCH);
    EXPECT_EQ(refused(some(kGeneralSparse), some(sa, 3, 4), some(kGeneralSparse, 4, 3)), SM_DIMENSION_MISMATCH);
    EXPECT_EQ(refused(some(kDiagonalRows), some(sa, 3, 4), some(kGeneralSparse, 4, 3)), SM_DIMENSION_MISMATCH)
        << "before the conversion refuses";
  }
}

TEST_P(SumRefusals, a_conversion_that_is_refused_ends_the_call_with_its_answer) {
  for (const Shape sa : kGeneralShapes)
    for (const Shape sc : {kSymmetricSparse, kSymmetricColumns, kSymmetricRows, kDiagonalColumns, kDiagonalRows}) {
      EXPECT_EQ(fn().qxsmvaxpy(typed(sc), some(sa, 3, 4), some(kGeneralSparse, 3, 4), 1.0, 0.0), SM_NOT_SQUARE)
          << name_of(sa) << " into " << name_of(sc);
      EXPECT_EQ(fn().qxsmvaxpy(typed(sc), some(sa), some(kGeneralSparse), 1.0, 0.0), SM_UNAVAILABLE)
          << name_of(sa) << " into " << name_of(sc);
    }
}

TEST_P(SumRefusals, kinds_that_do_not_pair_answer_124_before_119) {
  SmMatrix* c = typed(kSymmetricSparse);
  EXPECT_EQ(fn().qxsmvaxpy(c, some(kSymmetricRows), some(kGeneralRows), 1.0, 0.0), SM_UNAVAILABLE);
  EXPECT_EQ(fn().qxsmvaxpy(c, some(kSymmetricRows), some(kSymmetricRows), 1.0, 0.0), SM_ALREADY_CLOSED);
  EXPECT_TRUE(same(read(c), read(some(kSymmetricRows)))) << "it holds what the conversion left";
}

TEST_P(SumRefusals, a_result_that_is_the_first_operand_meets_the_checks_of_addition_only) {
  SmMatrix* none = new_untyped(session());
  EXPECT_EQ(fn().qxsmvaxpy(none, none, some(kGeneralSparse), 1.0, 0.0), SM_OK) << "nothing stored, nothing done";
  SmMatrix* sparse = some(kSymmetricSparse);
  EXPECT_EQ(refused(sparse, sparse, some(kSymmetricSparse, 5, 5)), SM_DIMENSION_MISMATCH) << "of the block";
  EXPECT_EQ(refused(sparse, sparse, some(kSymmetricSparse)), SM_ALREADY_CLOSED);
  EXPECT_EQ(refused(sparse, sparse, open(kSymmetricSparse)), SM_ALREADY_CLOSED) << "before the second one's state";
  EXPECT_EQ(refused(sparse, sparse, some(kGeneralSparse)), SM_UNAVAILABLE) << "kinds that do not pair";
  for (const Shape shape : kPacked) {
    SmMatrix* packed = some(shape);
    EXPECT_EQ(refused(packed, packed, some(kGeneralSparse)), SM_UNAVAILABLE) << name_of(shape);
    EXPECT_EQ(refused(packed, packed, some(kSymmetricRows, 3, 3)), SM_DIMENSION_MISMATCH) << name_of(shape);
    EXPECT_EQ(refused(packed, packed, open(kSymmetricSparse)), SM_NOT_CLOSED) << name_of(shape);
  }
  SmMatrix* taking = open(kSymmetricSparse);
  EXPECT_EQ(refused(taking, taking, open(kSymmetricSparse)), SM_NOT_CLOSED);
}

TEST_P(SumRefusals, without_memory_nothing_is_left_but_what_the_result_holds) {
  struct Triple {
    Shape c, a, b;
    std::int64_t requests;
  };
  for (const Triple& t : {Triple{kGeneralSparse, kGeneralSparse, kGeneralSparse, 3},
                          Triple{kGeneralSparse, kGeneralRows, kGeneralSparse, 3},
                          Triple{kGeneralSparse, kSymmetricSparse, kGeneralSparse, 3},
                          Triple{kGeneralSparse, kDiagonalRows, kGeneralSparse, 3},
                          Triple{kSymmetricSparse, kSymmetricSparse, kSymmetricSparse, 3},
                          Triple{kSymmetricSparse, kSymmetricSparse, kSymmetricRows, 3},
                          Triple{kSymmetricSparse, kSymmetricSparse, kDiagonalRows, 3},
                          Triple{kSymmetricColumns, kSymmetricSparse, kSymmetricRows, 1},
                          Triple{kSymmetricRows, kSymmetricColumns, kSymmetricSparse, 1},
                          Triple{kSymmetricRows, kDiagonalRows, kDiagonalColumns, 1},
                          Triple{kDiagonalRows, kDiagonalColumns, kDiagonalColumns, 1}}) {
    SCOPED_TRACE(name_of(t.c) + " <- " + name_of(t.a) + " + " + name_of(t.b));
    const FaultCase c{[&t](Session& session) {
                        Random random(21);
                        const auto make = [&](Shape shape) {
                          return sm::test::build(session, shape, random_known(random, shape, 30, 30));
                        };
                        return std::vector<SmMatrix*>{new_typed(session, t.c), make(t.a), make(t.b)};
                      },
                      [](Session& session, const std::vector<SmMatrix*>& m) {
                        return session.fn().qxsmvaxpy(m[0], m[1], m[2], 0.5, 0.0);
                      },
                      [](const std::vector<SmMatrix*>& m) { return read(m[0]).by_rows(); }};
    EXPECT_GE(survive(GetParam(), c), t.requests);
  }
}

INSTANTIATE_BOTH_HOSTS(SumRefusals);

}  // namespace
}  // namespace sm::test
