// qxsmsolioc: what it refuses, in which order, and what it has written by then.
#include "iterative/conjugate_gradients_reference.hpp"

namespace sm::test {
namespace {

class RefusalsTest : public ModuleTest {
 protected:
  SmMatrix* with(Shape shape, const Dense& a) { return build(session(), shape, a); }
  // Answers the status of a refusal that must leave x, the two results and the matrix as they were; b and x may be one.
  SmStatus untouched(SmMatrix* m, bool same, std::int32_t nrhs = 1) {
    std::vector<double> x(16, kUntouched);
    const std::vector<double> b(16, 1.0);
    std::int64_t iterations = -55;
    double residual = kUntouched;
    const Snapshot before = snapshot(m);
    const SmStatus status =
        fn().qxsmsolioc(m, same ? x.data() : b.data(), x.data(), nrhs, 0, &iterations, &residual, 1e-10);
    EXPECT_EQ(x, std::vector<double>(16, kUntouched));
    EXPECT_EQ(iterations, -55);
    EXPECT_EQ(residual, kUntouched);
    EXPECT_TRUE(snapshot(m) == before);
    return status;
  }
  // Answers the status of a call that must only tell that there were no iterations and no residual.
  SmStatus told(SmMatrix* m, std::int32_t nrhs) {
    std::vector<double> x(16, kUntouched);
    const std::vector<double> b(16, 1.0);
    std::int64_t iterations = -55;
    double residual = kUntouched;
    const SmStatus status = fn().qxsmsolioc(m, b.data(), x.data(), nrhs, 0, &iterations, &residual, 1e-10);
    EXPECT_EQ(x, std::vector<double>(16, kUntouched));
    EXPECT_EQ(iterations, 0);
    EXPECT_EQ(residual, 0.0);
    return status;
  }
};
INSTANTIATE_BOTH_HOSTS(RefusalsTest);

TEST_P(RefusalsTest, come_in_order) {
  for (const std::int32_t nrhs : {1, 0}) {
    EXPECT_EQ(untouched(new_untyped(session()), true, nrhs), SM_OK);
    EXPECT_EQ(untouched(build_open(session(), Dense(0, 0)), true, nrhs), SM_OK);  // empty before open
    EXPECT_EQ(untouched(new_sized(session(), kGeneralSparse, 2, 2), true, nrhs), SM_OK);
    SmMatrix* none = new_untyped_with_an_entry(session());
    EXPECT_EQ(untouched(none, true, nrhs), SM_UNTYPED);  // the kind before the state
    EXPECT_EQ(untouched(build_open(session(), from_diagonal({1, 2})), true, nrhs), SM_NOT_CLOSED);
    std::vector<double> data(4, 1.0);
    EXPECT_EQ(untouched(new_open_tied(session(), data, 2, 2, SM_KIND_GENERAL, SM_FORMAT_ROWS), true, nrhs),
              SM_NOT_CLOSED);  // the state before b and x, and before the kind
    for (const Shape shape : kShapes) {
      EXPECT_EQ(untouched(with(shape, from_diagonal({1, 2})), true, nrhs), SM_BAD_ARGUMENT) << name_of(shape);
    }
  }
}

TEST_P(RefusalsTest, a_general_matrix_answers_124_however_many_right_hand_sides_there_are) {
  for (const Shape shape : kGeneralShapes)
    for (const std::int32_t nrhs : {1, 2, 0, -1}) {
      EXPECT_EQ(told(with(shape, from_diagonal({1, 2})), nrhs), SM_UNAVAILABLE) << name_of(shape);
      EXPECT_EQ(told(with(shape, from_rows({{1, 2, 3}, {4, 5, 6}})), nrhs), SM_UNAVAILABLE);
    }
}

TEST_P(RefusalsTest, no_right_hand_sides_are_an_answer) {
  for (const Shape shape : kShapes) {
    if (shape.kind == SM_KIND_GENERAL) continue;
    for (const std::int32_t nrhs : {0, -1, std::numeric_limits<std::int32_t>::min()}) {
      SmMatrix* m = with(shape, from_diagonal({1, -5}));
      host().fail_request(0, true);
      EXPECT_EQ(told(m, nrhs), SM_OK) << name_of(shape);
      EXPECT_EQ(host().stop_failing(), 0) << "before any request, and before the diagonal is looked at";
    }
  }
}

TEST_P(RefusalsTest, a_diagonal_element_below_the_negative_limit_answers_103_with_no_iterations) {
  for (const Shape shape : kSymmetricShapes)
    for (const double bad : {-1.0, -0.125, -1e12}) {
      SmMatrix* m = with(shape, from_rows({{4, 1, 0}, {1, bad, 0}, {0, 0, 2}}));
      const std::int64_t blocks = host().live_blocks();
      const Snapshot before = snapshot(m);
      const Solved s = solve(m, {1, 2, 3, 4, 5, 6}, {1e-10, 0, 2});
      EXPECT_EQ(s.status, SM_NOT_DEFINITE) << name_of(shape);
      EXPECT_EQ(s.iterations, 0);
      EXPECT_EQ(host().live_blocks(), blocks);
      EXPECT_TRUE(snapshot(m) == before);
    }
  for (const Shape shape : kSymmetricShapes) {
    const Solved s = solve(with(shape, from_diagonal({4, -0.0625})), {1, 2}, {1e-10, 0, 1});
    EXPECT_EQ(s.status, SM_OK) << "within the limit";
    EXPECT_EQ(s.x, (std::vector<double>{0.25, 0}));
  }
}

TEST_P(RefusalsTest, work_goes_back_whatever_the_answer_is) {
  const Dense a = ill_conditioned(6, 1e4);
  for (const Shape shape : kSymmetricShapes) {
    SmMatrix* m = with(shape, a);
    const std::int64_t blocks = host().live_blocks();
    EXPECT_EQ(solve(m, {1, 2, 3, 4, 5, 6}, {1e-6, 100, 1}).status, SM_OK);
    EXPECT_EQ(host().live_blocks(), blocks);
    EXPECT_EQ(solve(m, {1, 2, 3, 4, 5, 6}, {1e-12, 2, 1}).status, SM_NOT_CONVERGED);
    EXPECT_EQ(host().live_blocks(), blocks);
    EXPECT_EQ(solve(m, {kNan, 2, 3, 4, 5, 6}, {1e-12, 2, 1}).status, SM_NOT_CONVERGED);
    EXPECT_EQ(host().live_blocks(), blocks) << name_of(shape);
  }
}

}  // namespace
}  // namespace sm::test
