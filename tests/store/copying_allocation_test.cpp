// Every request of copies and conversions refused in turn, once and from then on.
#include <gtest/gtest.h>

#include "cholesky/cholesky_support.hpp"
#include "store/filled.hpp"

namespace sm::test {
namespace {

struct Pair {
  Filled source;
  SmMatrix* target;
};

// The same each time it is called, so that every run asks for the same.
Filled source_of(Session& session, Shape shape) {
  Random random(31);
  if (shape.kind == SM_KIND_GENERAL) return filled(session, shape, 30, 45, random);
  return filled_definite(session, shape, 30, random);
}

// A target that holds more blocks than it will, so that what a failure leaves is never more than there was.
SmMatrix* target_of(Session& session, Shape shape) {
  Random random(32);
  if (shape.kind == SM_KIND_GENERAL) return filled(session, shape, 60, 60, random).matrix;
  SmMatrix* m = filled_definite(session, shape, 60, random).matrix;
  EXPECT_EQ(session.fn().qxsmfact(m, 0), SM_OK);
  return m;
}

class CopyingAllocation : public ::testing::TestWithParam<HostKind> {
 protected:
  // Refuses every request of run(session, pair), which looks at the target itself. The source is as it was after every
  // call. Answers the number of requests.
  template <class Run>
  std::int64_t refuse_all(Shape from, Shape to, std::int32_t state, Run run) {
    return survives_every_allocation_failure(
        GetParam(),
        [&](Session& session) {
          Pair p{source_of(session, from), target_of(session, to)};
          if (from.kind == SM_KIND_SYMMETRIC && is_sparse(from)) {
            EXPECT_EQ(bring_to(p.source.matrix, state), SM_OK);
          }
          return p;
        },
        [&](Session& session, Pair& p) {
          const SmStatus status = run(session, p);
          EXPECT_EQ(p.source.matrix->state, state);
          if (state <= SM_STATE_ORDERED) {
            EXPECT_EQ(entries(p.source.matrix), p.source.stored);
          } else {
            EXPECT_TRUE(same(dense_of_rows(p.source.matrix), p.source.dense));
          }
          return status;
        });
  }
};

TEST_P(CopyingAllocation, a_clone_of_values_is_complete_or_answers_101) {
  for (const Shape shape : {kGeneralSparse, kGeneralColumns, kGeneralRows, kSymmetricColumns, kSymmetricRows,
                            kDiagonalColumns, kDiagonalRows}) {
    SCOPED_TRACE(name_of(shape));
    const std::int64_t requests = refuse_all(shape, shape, SM_STATE_CLOSED, [](Session& session, Pair& p) {
      const SmStatus status = session.fn().qxsmclone(p.source.matrix, p.target, 0);
      if (status == SM_OK) {
        EXPECT_EQ(entries(p.target), p.source.stored);
      }
      return status;
    });
    EXPECT_GE(requests, is_sparse(shape) ? 3 : 1);
  }
}

TEST_P(CopyingAllocation, a_clone_of_compressed_rows_is_complete_or_has_none) {
  for (std::int32_t state = SM_STATE_CLOSED; state <= SM_STATE_FACTORED; ++state) {
    SCOPED_TRACE(state);
    const std::int64_t requests =
        refuse_all(kSymmetricSparse, kSymmetricSparse, state, [state](Session& session, Pair& p) {
          const SmStatus status = session.fn().qxsmclone(p.source.matrix, p.target, 0);
          if (status == SM_OK) {
            EXPECT_EQ(p.target->state, state);
            EXPECT_EQ(rows_of(p.target), rows_of(p.source.matrix));
            EXPECT_EQ(p.target->work_capacity, p.source.matrix->work_capacity);
          } else {
            EXPECT_EQ(p.target->state, SM_STATE_OPEN);
            EXPECT_EQ(p.target->row_start, nullptr);
            EXPECT_EQ(p.target->perm, nullptr);
            EXPECT_EQ(p.target->work, nullptr);
            EXPECT_EQ(p.target->work_capacity, 0);
          }
          return status;
        });
    // A pool, a slab and roots for sizing; then the rows, from state 2 on the ordering and its workspace.
    EXPECT_EQ(requests, state == SM_STATE_CLOSED ? 6 : 9);
  }
}

TEST_P(CopyingAllocation, a_clone_whose_rows_cannot_be_had_is_open_with_its_zero_diagonal) {
  for (std::int64_t k = 3; k < 9; ++k) {  // behind the requests of sizing
    SCOPED_TRACE(k);
    Session session(GetParam());
    Pair p{source_of(session, kSymmetricSparse), target_of(session, kSymmetricSparse)};
    ASSERT_EQ(bring_to(p.source.matrix, SM_STATE_FACTORED), SM_OK);
    session.host().fail_request(k, true);
    EXPECT_EQ(session.fn().qxsmclone(p.source.matrix, p.target, 0), SM_NO_MEMORY);
    EXPECT_GT(session.host().stop_failing(), 0);
    Nonzeros expected;
    for (std::int64_t i = 0; i < 30; ++i) expected[{i, i}] = 0.0;
    EXPECT_EQ(entries(p.target), expected);
    EXPECT_EQ(p.target->state, SM_STATE_OPEN);
    expect_voided(p.target);
    expected[{3, 7}] = 1.0;
    EXPECT_EQ(session.fn().qxsmassign(p.target, 3, 7, 0, 1.0), SM_OK);
    EXPECT_EQ(session.fn().qxsmclose(p.target, kNan), SM_OK);
    EXPECT_EQ(compressed(p.target), expected);
  }
}

TEST_P(CopyingAllocation, a_reassembled_clone_is_complete_or_answers_101) {
  for (const std::int32_t state : {SM_STATE_CLOSED, SM_STATE_FACTORED}) {
    const std::int64_t requests = refuse_all(kSymmetricSparse, kSymmetricSparse, state, [](Session& session, Pair& p) {
      const SmStatus status = session.fn().qxsmclone(p.source.matrix, p.target, 1);
      EXPECT_EQ(p.target->state, SM_STATE_OPEN);
      if (status == SM_OK) {
        EXPECT_EQ(entries(p.target), p.source.stored);
      }
      return status;
    });
    EXPECT_GE(requests, 3);
  }
}

TEST_P(CopyingAllocation, every_conversion_is_complete_or_answers_101) {
  for (const Shape from : kShapes)
    for (const Shape to : kShapes) {
      const bool served = from.kind == to.kind || from.kind == SM_KIND_DIAGONAL || to.kind == SM_KIND_GENERAL;
      if (!served || (from.kind == to.kind && from.format == to.format)) continue;
      SCOPED_TRACE(name_of(from) + " to " + name_of(to));
      const std::int64_t requests = refuse_all(from, to, SM_STATE_CLOSED, [](Session& session, Pair& p) {
        const SmStatus status = session.fn().qxsmconvert(p.source.matrix, p.target, 0);
        if (status == SM_OK) {
          EXPECT_TRUE(same(contents(p.target), p.source.dense));
          EXPECT_EQ(p.target->state, SM_STATE_CLOSED);
        }
        return status;
      });
      EXPECT_GE(requests, to.kind == SM_KIND_SYMMETRIC && is_sparse(to) ? 6 : is_sparse(to) ? 3 : 1);
    }
}

TEST_P(CopyingAllocation, a_load_that_cannot_be_sized_keeps_its_type_and_one_that_cannot_be_typed_is_of_kind_none) {
  const std::vector<double> values(16, 2.5);
  for (const Shape from : kShapes)
    for (const Shape to : kDense)
      for (const bool for_ever : {false, true}) {
        SCOPED_TRACE(name_of(from) + " to " + name_of(to));
        std::int64_t k = 0;
        for (bool met = true; met; ++k) {
          Session session(GetParam());
          Random random(33);
          SmMatrix* m = filled(session, from, 6, 6, random).matrix;
          const auto load = [&] { return qxsmcopyv(values.data(), m, 4, 4, to.kind, to.format); };
          session.host().fail_request(k, for_ever);
          const SmStatus status = load();
          met = session.host().stop_failing() > 0;
          EXPECT_EQ(status, met ? SM_NO_MEMORY : SM_OK) << k;
          if (met && m->kind == SM_KIND_NONE) {
            EXPECT_EQ(m->nnz, 0);
            EXPECT_EQ(load(), SM_UNTYPED);
            EXPECT_EQ(session.fn().qxsmnew(session.instance(), &m, to.kind, to.format), SM_OK);
          }
          EXPECT_EQ(load(), SM_OK);
          EXPECT_EQ(doubles(m->values, m->nnz), std::vector<double>(at(slots(to, 4, 4)), 2.5));
          session.close();
          EXPECT_EQ(session.host().live_pools(), 0);
          EXPECT_EQ(session.host().live_blocks(), 0);
          EXPECT_EQ(session.host().violations(), 0);
        }
        EXPECT_EQ(k, 3) << "a pool to be typed, an array to be sized";
      }
}

TEST_P(CopyingAllocation, what_is_read_or_loaded_in_place_asks_for_no_memory) {
  for (const Shape shape : kShapes) {
    SCOPED_TRACE(name_of(shape));
    Session session(GetParam());
    Random random(34);
    const Filled a = filled(session, shape, 5, 5, random);
    session.host().fail_request(0, true);
    Output out(25);
    std::int16_t flag = 0;
    EXPECT_EQ(qxsmrow(a.matrix, 1, out.data(), 0), SM_OK);
    EXPECT_EQ(qxsmUpperRow(a.matrix, 1, out.data()),
              shape.kind == SM_KIND_SYMMETRIC && shape.format != SM_FORMAT_COLUMNS ? SM_OK : SM_UNAVAILABLE);
    EXPECT_EQ(qxsmUpperSub(a.matrix, out.data(), 0, 2, 1, 3),
              shape.kind == SM_KIND_SYMMETRIC && is_sparse(shape) ? SM_OK : SM_UNAVAILABLE);
    EXPECT_EQ(session.fn().qxsmdiag(a.matrix, out.data(), 0, 4), SM_OK);
    EXPECT_EQ(session.fn().qxsmdense(a.matrix, out.data(), 2), SM_OK);
    EXPECT_EQ(session.fn().qxsmIsDiag(a.matrix, &flag, 0.0), SM_OK);
    EXPECT_EQ(session.fn().qxsmclone(a.matrix, a.matrix, 0), SM_OK);
    EXPECT_EQ(session.fn().qxsmconvert(a.matrix, a.matrix, 0), SM_OK);
    if (!is_sparse(shape)) {
      const std::vector<double> values(25, 1.5);
      EXPECT_EQ(qxsmcopyv(values.data(), a.matrix, 5, 5, shape.kind, shape.format), SM_OK);
    }
    EXPECT_EQ(session.host().stop_failing(), 0);
  }
}

INSTANTIATE_BOTH_HOSTS(CopyingAllocation);

}  // namespace
}  // namespace sm::test
