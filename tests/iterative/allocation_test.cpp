// Every request of the iterative solver refused in turn, once and from there on.
#include "iterative/conjugate_gradients_reference.hpp"

namespace sm::test {
namespace {

class SolverAllocationTest : public ::testing::TestWithParam<HostKind> {};
INSTANTIATE_BOTH_HOSTS(SolverAllocationTest);

const Dense kDefinite = from_rows({{4, 2, 0, 1}, {2, 5, 1, 0}, {0, 1, 8, 2}, {1, 0, 2, 9}});

struct Task {
  SmMatrix* m;
  Solved solved;
};

SmStatus run(Session& session, Task& p) {
  const std::int64_t blocks = session.host().live_blocks();
  p.solved = solve(p.m, {1, 2, 3, 4, 5, 6, 7, 8}, {1e-10, 0, 2});
  if (p.solved.status != SM_OK) {
    EXPECT_LE(session.host().live_blocks(), blocks);
  }
  return p.solved.status;
}

std::vector<double> answer(Task& p) {
  std::vector<double> all = p.solved.x;
  all.push_back(static_cast<double>(p.solved.iterations));
  all.push_back(p.solved.residual);
  return all;
}

TEST_P(SolverAllocationTest, iterating_takes_memory_and_dividing_none) {
  for (const Shape shape : kInvertible) {
    SCOPED_TRACE(name_of(shape));
    const std::int64_t requests = survives(
        GetParam(),
        [&](Session& s) {
          return Task{build(s, shape, kDefinite), {}};
        },
        run, answer, is_no_memory);
    if (shape.kind == SM_KIND_DIAGONAL) {
      EXPECT_EQ(requests, 0);
    } else {
      const bool lists = shape == kSymmetricSparse;
      EXPECT_EQ(requests, 4 + lists) << "the preconditioner and three vectors, and what is known of compressed rows";
    }
  }
}

TEST_P(SolverAllocationTest, a_tied_record_without_a_pool_gets_one) {
  for (const Shape shape : kPacked) {
    std::vector<double> data = laid_out(shape, kDefinite);
    Session calm(GetParam());
    Task p{new_tied(calm, shape, data, 4, 4), {}};
    EXPECT_EQ(run(calm, p), SM_OK);
    const std::vector<double> want = answer(p);
    EXPECT_GE(survives(
                  GetParam(),
                  [&](Session& s) {
                    return Task{new_tied(s, shape, data, 4, 4), {}};
                  },
                  [](Session&, Task& q) {
                    q.solved = solve(q.m, {1, 2, 3, 4, 5, 6, 7, 8}, {1e-10, 0, 2});
                    return q.solved.status;
                  },
                  answer, is_no_memory),
              2);
    EXPECT_EQ(data, laid_out(shape, kDefinite));
  }
}

}  // namespace
}  // namespace sm::test
