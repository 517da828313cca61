// Every request of the traces refused in turn, once and from then on.
#include <gtest/gtest.h>

#include "cholesky/cholesky_support.hpp"
#include "store/filled.hpp"

namespace sm::test {
namespace {

struct Operands {
  Filled a;
  Filled b;
};

class TraceAllocation : public ::testing::TestWithParam<HostKind> {
 protected:
  // Positive definite where the shape can be, and the same each time.
  static Operands operands(Session& session, Shape sa, Shape sb) {
    Random random(11);
    const auto make = [&](Shape shape) {
      return shape.kind == SM_KIND_GENERAL ? filled(session, shape, 9, 9, random)
                                           : filled_definite(session, shape, 9, random);
    };
    Filled a = make(sa);
    Filled b = make(sb);
    return {a, b};
  }
  static double trace_of_product(const Dense& a, const Dense& b) {
    long double sum = 0.0L;
    const Dense p = product(a, b);
    for (std::int64_t i = 0; i < p.rows(); ++i) sum += p(i, i);
    return static_cast<double>(sum);
  }
};

TEST_P(TraceAllocation, a_diagonal_matrix_needs_one_vector_and_gives_it_back) {
  for (const Shape sa : {kDiagonalColumns, kDiagonalRows})
    for (const Shape sb : kShapes) {
      SCOPED_TRACE(name_of(sa) + ", " + name_of(sb));
      const std::int64_t requests = survives_every_allocation_failure(
          GetParam(), [&](Session& session) { return operands(session, sa, sb); },
          [](Session& session, Operands& o) {
            const std::int64_t blocks = session.host().live_blocks();
            double result = 0.0;
            const SmStatus status = session.fn().qxsmtraceAB(o.a.matrix, o.b.matrix, &result);
            if (status == SM_OK) {
              EXPECT_EQ(result, trace_of_product(o.a.dense, o.b.dense));
            } else {
              EXPECT_TRUE(is_missing(result));
            }
            EXPECT_EQ(session.host().live_blocks(), blocks);
            return status;
          });
      EXPECT_EQ(requests, 1);
    }
}

TEST_P(TraceAllocation, two_sparse_matrices_without_a_vector_answer_0_and_the_missing_value) {
  for (std::int32_t state = SM_STATE_CLOSED; state <= SM_STATE_FACTORED; ++state)
    for (const bool for_ever : {false, true}) {
      Session session(GetParam());
      const Operands o = operands(session, kSymmetricSparse, kSymmetricSparse);
      ASSERT_EQ(bring_to(o.a.matrix, state), SM_OK);
      const std::int64_t blocks = session.host().live_blocks();
      double result = 0.0;
      session.host().fail_request(0, for_ever);
      EXPECT_EQ(session.fn().qxsmtraceAB(o.a.matrix, o.b.matrix, &result), SM_OK);
      EXPECT_EQ(session.host().stop_failing(), 1);
      EXPECT_TRUE(is_missing(result));
      EXPECT_EQ(session.host().live_blocks(), blocks);
      EXPECT_EQ(session.fn().qxsmtraceAB(o.a.matrix, o.b.matrix, &result), SM_OK);
      EXPECT_EQ(result, trace_of_product(o.a.dense, o.b.dense));
      EXPECT_EQ(session.host().live_blocks(), blocks);
      session.host().fail_request(1, for_ever);
      EXPECT_EQ(session.fn().qxsmtraceAB(o.a.matrix, o.b.matrix, &result), SM_OK);
      EXPECT_EQ(session.host().stop_failing(), 0) << "one vector is all it needs";
      EXPECT_EQ(result, trace_of_product(o.a.dense, o.b.dense));
    }
}

TEST_P(TraceAllocation, every_other_pair_and_the_trace_of_one_matrix_need_no_memory) {
  for (const Shape sa : kShapes)
    for (const Shape sb : kShapes) {
      if (sa.kind == SM_KIND_DIAGONAL) continue;
      if (sa.kind == SM_KIND_SYMMETRIC && is_sparse(sa) && sb.kind == SM_KIND_SYMMETRIC && is_sparse(sb)) continue;
      Session session(GetParam());
      const Operands o = operands(session, sa, sb);
      double result = 0.0;
      session.host().fail_request(0, true);
      const SmStatus status = session.fn().qxsmtraceAB(o.a.matrix, o.b.matrix, &result);
      EXPECT_EQ(session.host().stop_failing(), 0) << name_of(sa) << ", " << name_of(sb);
      if (status == SM_OK) {
        EXPECT_EQ(result, trace_of_product(o.a.dense, o.b.dense)) << name_of(sa) << ", " << name_of(sb);
      } else {
        EXPECT_EQ(status, SM_UNAVAILABLE);
      }
      session.host().fail_request(0, true);
      EXPECT_EQ(session.fn().qxsmtrace(o.a.matrix, &result), SM_OK);
      EXPECT_EQ(session.host().stop_failing(), 0);
      EXPECT_EQ(result, trace_of_product(o.a.dense, identity(9)));
    }
}

TEST_P(TraceAllocation, the_trace_with_an_inverse_leaves_nothing_but_the_factor) {
  for (const Shape sa : kInvertible)
    for (const Shape sb : kShapes)
      for (const bool factored : {false, true}) {
        SCOPED_TRACE(name_of(sa) + ", " + name_of(sb));
        double expected = 0.0;
        double result = 0.0;
        std::int64_t others = 0;
        const auto prepare = [&](Session& session) {
          const Operands o = operands(session, sa, sb);
          if (factored) {
            EXPECT_EQ(session.fn().qxsmfact(o.a.matrix, 0), SM_OK);
          }
          others = session.host().live_blocks() - owned_blocks(o.a.matrix);
          expected = trace_of_product(inverse(o.a.dense), transposed(o.b.dense));
          return o;
        };
        const auto run = [&](Session& session, const Operands& o) {
          const SmStatus status = qxsmtraceinvAB(o.a.matrix, o.b.matrix, 0, &result);
          if (status == SM_OK) {
            EXPECT_NEAR(result, expected, 1e-10);
          }
          EXPECT_EQ(session.host().live_blocks(), others + owned_blocks(o.a.matrix));
          return status;
        };
        const auto check = [&](Session& session, const Operands& o, SmStatus status, std::int64_t) {
          // Where selected inversion serves, solves take its place.
          const bool gives_way = sa.kind == SM_KIND_SYMMETRIC && is_sparse(sa) && status == SM_OK;
          EXPECT_EQ(status, gives_way ? SM_OK : SM_NO_MEMORY);
          // Missing before the sum began, and else what was summed before the work of a solve could not be had.
          EXPECT_TRUE(gives_way || is_missing(result) || o.a.matrix->state == SM_STATE_FACTORED);
          EXPECT_EQ(run(session, o), SM_OK) << "again";
        };
        EXPECT_GE(refuse_each_request(GetParam(), prepare, run, check), 2) << "two vectors at least";
      }
}

TEST_P(TraceAllocation, without_memory_for_selected_inversion_the_trace_is_solved_for) {
  for (const Shape sb : {kSymmetricSparse, kDiagonalColumns, kDiagonalRows})
    for (const bool for_ever : {false, true})
      for (std::int64_t k = 0; k <= 7; ++k) {
        Session session(GetParam());
        Random random(12);
        const Filled a = filled_definite(session, kSymmetricSparse, 12, random);
        Nonzeros elements;
        for (const auto& [at, value] : a.stored) {
          if (at.first == at.second || sb.kind == SM_KIND_SYMMETRIC) elements[at] = value + 1.0;
        }
        const Filled b = filled_with(session, sb, 12, 12, elements);
        ASSERT_EQ(session.fn().qxsmfact(a.matrix, 0), SM_OK);
        const double expected = trace_of_product(inverse(a.dense), b.dense);
        const std::int64_t blocks = session.host().live_blocks();
        double result = 0.0;
        session.host().fail_request(k, for_ever);
        EXPECT_EQ(qxsmtraceinvAB(a.matrix, b.matrix, 0, &result), k < 2 ? SM_NO_MEMORY : SM_OK) << k;
        EXPECT_EQ(session.host().stop_failing() > 0, k < 7) << "two vectors, places, four of selected inversion";
        if (k >= 2) {
          EXPECT_NEAR(result, expected, 1e-10) << k;
        }
        EXPECT_EQ(session.host().live_blocks(), blocks) << k;
        EXPECT_EQ(session.host().violations(), 0);
      }
}

INSTANTIATE_BOTH_HOSTS(TraceAllocation);

}  // namespace
}  // namespace sm::test
