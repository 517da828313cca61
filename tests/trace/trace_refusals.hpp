// What the traces of two matrices refuse alike, whichever of them it is.
#pragma once

#include "store/filled.hpp"

namespace sm::test {

class TraceRefusals : public ModuleTest {
 protected:
  SmMatrix* some(Shape shape, std::int64_t rows, std::int64_t cols) {
    Random random(1);
    return filled(session(), shape, rows, cols, random).matrix;
  }
  // refused(a, b) is the status of a call that must leave the missing value.
  template <class Refused>
  void expect_nothing_to_report(Refused refused) {
    for (const Shape sa : kShapes)
      for (const Shape sb : kShapes) {
        SmMatrix* a = new_sized(session(), sa, 0, 0);
        SmMatrix* b = new_sized(session(), sb, 0, 0);
        a->state = b->state = SM_STATE_OPEN;
        EXPECT_EQ(refused(a, b), SM_NOTHING_TO_REPORT) << name_of(sa) << ", " << name_of(sb);
      }
    EXPECT_EQ(refused(new_sized(session(), kGeneralSparse, 3, 4), new_sized(session(), kGeneralSparse, 2, 5)),
              SM_NOTHING_TO_REPORT);
    for (const Shape shape : kShapes) {
      const Unclosed open = unclosed(session(), shape);
      for (SmMatrix* none : {new_untyped(session()), new_untyped_with_an_entry(session())}) {
        EXPECT_EQ(refused(none, open.matrix), SM_NOTHING_TO_REPORT) << name_of(shape);
        EXPECT_EQ(refused(open.matrix, none), SM_NOTHING_TO_REPORT) << name_of(shape);
      }
    }
  }
  template <class Refused>
  void expect_not_closed(Refused refused) {
    for (const Shape shape : kShapes) {
      const Unclosed open = unclosed(session(), shape);
      for (const Shape other : kShapes) {
        EXPECT_EQ(refused(open.matrix, some(other, 5, 5)), SM_NOT_CLOSED) << name_of(shape) << ", " << name_of(other);
        EXPECT_EQ(refused(some(other, 5, 5), open.matrix), SM_NOT_CLOSED) << name_of(other) << ", " << name_of(shape);
      }
      SmMatrix* empty = new_sized(session(), kGeneralSparse, 9, 9);
      EXPECT_EQ(refused(open.matrix, empty), SM_NOT_CLOSED) << "with an empty one too";
    }
    for (const std::int64_t n : {3, 4}) {
      EXPECT_EQ(refused(new_without_rows(session(), 3), some(kSymmetricRows, n, n)), SM_NOT_CLOSED);
      EXPECT_EQ(refused(some(kSymmetricRows, n, n), new_without_rows(session(), 3)), SM_NOT_CLOSED);
    }
  }
};

}  // namespace sm::test
