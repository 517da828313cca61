// qxsmsetprogress: who is called, when, with what, and how it stops a solve.
#include "iterative/conjugate_gradients_reference.hpp"

namespace sm::test {
namespace {

class ProgressTest : public ModuleTest {
 protected:
  ProgressTest() {
    Random random(131);
    a_ = positive_definite(grid(4, 4), random).dense();
    b_ = random.vector(16);
  }
  SmMatrix* with(Shape shape) { return build(session(), shape, a_); }
  Dense a_;
  std::vector<double> b_;
};
INSTANTIATE_BOTH_HOSTS(ProgressTest);

TEST_P(ProgressTest, is_told_rho_the_user_word_and_the_number_after_every_step) {
  const Recurrence want = conjugate_gradients(a_, b_, 6);
  for (const Shape shape : kSymmetricShapes) {
    SmMatrix* m = with(shape);
    m->solver_word = -1234567890123;
    Recorder recorder;
    ASSERT_EQ(qxsmsetprogress(instance(), Recorder::record, &recorder), SM_OK);
    const Solved s = solve(m, b_, {0.0, 6, 1});
    ASSERT_EQ(recorder.steps.size(), 6U);
    for (std::int64_t k = 1; k <= 6; ++k) {
      const Step& step = recorder.steps[at(k - 1)];
      EXPECT_EQ(step.iteration, k);
      EXPECT_EQ(step.user_word, -1234567890123);
      EXPECT_NEAR(step.rho, static_cast<double>(want.rho[at(k)]), 1e-9 * static_cast<double>(want.rho[at(k)]));
    }
    EXPECT_EQ(recorder.steps.back().rho, s.residual);
    EXPECT_EQ(m->solver_word, -1234567890123);
    m->solver_word = 0;
  }
}

TEST_P(ProgressTest, changes_nothing_by_listening) {
  for (const Shape shape : kSymmetricShapes) {
    SmMatrix* m = with(shape);
    const Solved silent = solve(m, b_);
    Recorder recorder;
    ASSERT_EQ(qxsmsetprogress(instance(), Recorder::record, &recorder), SM_OK);
    const Solved heard = solve(m, b_);
    EXPECT_EQ(heard.status, SM_OK);
    EXPECT_EQ(heard.x, silent.x);
    EXPECT_EQ(heard.iterations, silent.iterations);
    EXPECT_EQ(heard.residual, silent.residual);
    EXPECT_EQ(static_cast<std::int64_t>(recorder.steps.size()), heard.iterations);
    ASSERT_EQ(qxsmsetprogress(instance(), nullptr, nullptr), SM_OK);
  }
}

TEST_P(ProgressTest, stops_the_solve_with_the_last_iterate_in_x) {
  const Recurrence want = conjugate_gradients(a_, b_, 4);
  for (const Shape shape : kSymmetricShapes)
    for (const std::int32_t answer : {1, -1, 1 << 16}) {
      SmMatrix* m = with(shape);
      for (std::int64_t stop = 1; stop <= 4; ++stop) {
        Recorder recorder;
        recorder.stop_at = stop;
        recorder.answer = answer;
        ASSERT_EQ(qxsmsetprogress(instance(), Recorder::record, &recorder), SM_OK);
        const Solved s = solve(m, b_, {1e-12, 0, 1});
        EXPECT_EQ(s.status, SM_NOT_CONVERGED);
        EXPECT_EQ(s.iterations, stop);
        EXPECT_EQ(static_cast<std::int64_t>(recorder.steps.size()), stop);
        EXPECT_TRUE(near(s.x, want.iterates[at(stop - 1)], 1e-12));
        EXPECT_EQ(s.residual, recorder.steps.back().rho);
      }
    }
}

TEST_P(ProgressTest, counts_from_1_for_each_right_hand_side_and_stops_the_later_ones) {
  std::vector<double> b = b_;
  b.insert(b.end(), 16, 0.0);  // converged at once: no step
  b.insert(b.end(), b_.begin(), b_.end());
  b.insert(b.end(), b_.begin(), b_.end());
  for (const Shape shape : kSymmetricShapes) {
    SmMatrix* m = with(shape);
    Recorder recorder;
    ASSERT_EQ(qxsmsetprogress(instance(), Recorder::record, &recorder), SM_OK);
    const Solved all = solve(m, b, {1e-6, 100, 4});
    ASSERT_EQ(all.status, SM_OK);
    const auto each = static_cast<std::size_t>(all.iterations);
    ASSERT_GT(each, 2U);
    ASSERT_EQ(recorder.steps.size(), 3 * each);
    for (std::size_t k = 0; k < 3 * each; ++k) {
      EXPECT_EQ(recorder.steps[k].iteration, static_cast<std::int64_t>(k % each) + 1);
      EXPECT_EQ(recorder.steps[k].rho, recorder.steps[k % each].rho);
    }
    // Stopping in the first step of the third: the fourth is never begun.
    struct Third {
      int seen = 0;
      static std::int32_t stop(void* context, double, std::int64_t, std::int64_t iteration) {
        auto* self = static_cast<Third*>(context);
        self->seen += iteration == 1;
        return self->seen == 2;
      }
    } third;
    ASSERT_EQ(qxsmsetprogress(instance(), Third::stop, &third), SM_OK);
    const Solved s = solve(m, b, {1e-6, 100, 4});
    EXPECT_EQ(s.status, SM_NOT_CONVERGED);
    EXPECT_EQ(s.iterations, 1);
    EXPECT_EQ((std::vector<double>(s.x.begin(), s.x.begin() + 16)),
              (std::vector<double>(all.x.begin(), all.x.begin() + 16)));
    EXPECT_TRUE(near({s.x.begin() + 32, s.x.begin() + 48}, conjugate_gradients(a_, b_, 1).iterates[0], 1e-13));
    EXPECT_EQ((std::vector<double>(s.x.begin() + 48, s.x.end())), std::vector<double>(16, 0.0));
  }
}

TEST_P(ProgressTest, is_one_for_each_instance_and_none_at_first) {
  SmInstance* second = CreateInstance(session().extension());
  ASSERT_NE(second, nullptr);
  SmMatrix* mine = with(kSymmetricSparse);
  SmMatrix* theirs = nullptr;
  ASSERT_EQ(second->functions->qxsmnewds(second, &theirs, 2), SM_OK);
  ASSERT_EQ(second->functions->qxsmassign(theirs, 0, 0, 0, 4.0), SM_OK);
  ASSERT_EQ(second->functions->qxsmassign(theirs, 0, 1, 0, 1.0), SM_OK);
  ASSERT_EQ(second->functions->qxsmassign(theirs, 1, 1, 0, 3.0), SM_OK);
  Recorder first_recorder;
  ASSERT_EQ(qxsmsetprogress(instance(), Recorder::record, &first_recorder), SM_OK);
  EXPECT_EQ(solve(theirs, {1, 2}).status, SM_OK);
  EXPECT_TRUE(first_recorder.steps.empty());
  Recorder second_recorder;
  ASSERT_EQ(qxsmsetprogress(second, Recorder::record, &second_recorder), SM_OK);
  EXPECT_EQ(solve(theirs, {1, 2}).status, SM_OK);
  EXPECT_TRUE(first_recorder.steps.empty());
  EXPECT_EQ(second_recorder.steps.size(), 2U);
  EXPECT_EQ(solve(mine, b_).status, SM_OK);
  EXPECT_FALSE(first_recorder.steps.empty());
  EXPECT_EQ(second_recorder.steps.size(), 2U);
  EXPECT_EQ(qxsmDestroyInstance(&second), SM_OK);
}

TEST_P(ProgressTest, is_replaced_and_taken_away) {
  SmMatrix* m = with(kSymmetricRows);
  Recorder first;
  Recorder second;
  ASSERT_EQ(qxsmsetprogress(instance(), Recorder::record, &first), SM_OK);
  solve(m, b_, {0.0, 2, 1});
  ASSERT_EQ(qxsmsetprogress(instance(), Recorder::record, &second), SM_OK);
  solve(m, b_, {0.0, 3, 1});
  ASSERT_EQ(qxsmsetprogress(instance(), nullptr, &second), SM_OK);
  solve(m, b_, {0.0, 4, 1});
  EXPECT_EQ(first.steps.size(), 2U);
  EXPECT_EQ(second.steps.size(), 3U);
}

TEST_P(ProgressTest, asks_the_host_for_nothing_and_leaves_the_spare_word_0) {
  Recorder recorder;
  const std::int64_t blocks = host().live_blocks();
  host().fail_request(0, true);
  EXPECT_EQ(qxsmsetprogress(instance(), Recorder::record, &recorder), SM_OK);
  EXPECT_EQ(host().stop_failing(), 0);
  EXPECT_EQ(host().live_blocks(), blocks);
  EXPECT_EQ(*instance()->spare_word, 0);
  EXPECT_EQ(instance()->tolerances[3], 1.491668147e-154) << "the settings are elsewhere";
}

TEST_P(ProgressTest, is_not_called_without_a_step) {
  Recorder recorder;
  ASSERT_EQ(qxsmsetprogress(instance(), Recorder::record, &recorder), SM_OK);
  solve(with(kSymmetricSparse), std::vector<double>(16, 0.0));
  solve(with(kSymmetricSparse), b_, {1.0, 0, 1});
  solve(build(session(), kDiagonalRows, from_diagonal(b_)), b_);
  EXPECT_TRUE(recorder.steps.empty());
}

TEST_P(ProgressTest, hears_of_a_rho_that_is_no_number_or_not_but_the_solve_stops) {
  Recorder recorder;
  ASSERT_EQ(qxsmsetprogress(instance(), Recorder::record, &recorder), SM_OK);
  const Solved s = solve(build(session(), kSymmetricRows, from_rows({{1, 1}, {1, 1}})), {1, -1}, {1e-10, 100, 1});
  EXPECT_EQ(s.status, SM_NOT_CONVERGED);
  EXPECT_LE(recorder.steps.size(), 1U);
}

}  // namespace
}  // namespace sm::test
