// Every request of every operation refused in turn, once and from there on.
#include <string>

#include "ginv/ginv_support.hpp"

namespace sm::test {
namespace {

class GinvAllocationTest : public ::testing::TestWithParam<HostKind> {};
INSTANTIATE_BOTH_HOSTS(GinvAllocationTest);

const Dense kDefinite = from_rows({{4, 2, 0, 1}, {2, 5, 1, 0}, {0, 1, 8, 2}, {1, 0, 2, 9}});

struct Pair {
  SmMatrix* a;
  SmMatrix* b;
  SmMatrix* p = nullptr;
};

// A general sparse matrix whose slab has its spare node left; row 20 is empty.
SmMatrix* nearly_full(Session& session) {
  SmMatrix* m = new_sized(session, kGeneralSparse, 21, 40);
  for (std::int64_t k = 0; k < m->slab_nodes - 1; ++k) {
    EXPECT_EQ(session.fn().qxsmassign(m, k / 40, k % 40, 0, 1.0), SM_OK);
  }
  return m;
}

TEST_P(GinvAllocationTest, pivots) {
  for (const Shape shape : {kSymmetricSparse, kSymmetricColumns, kSymmetricRows, kDiagonalColumns, kDiagonalRows}) {
    SCOPED_TRACE(name_of(shape));
    std::string pivots;
    const std::int64_t requests = survives(
        GetParam(), [&](Session& s) { return build(s, shape, kDefinite); },
        [&](Session& s, SmMatrix* m) {
          pivots = "????";
          const SmStatus status = s.fn().qxsmpivot(m, pivots.data());
          EXPECT_EQ(pivots, status == SM_OK ? "1111" : "????");
          return status;
        },
        [&](SmMatrix*) { return pivots; }, is_no_memory);
    EXPECT_GE(requests, 1);
  }
}

TEST_P(GinvAllocationTest, checking_a_vector) {
  const std::vector<double> x{1, 2, 3, 4};
  std::int64_t failed = 0;
  std::int32_t flag = 0;
  const auto check = [&](char mode) {
    return [&failed, &flag, &x, mode](Session& s, SmMatrix* m) {
      failed = -1;
      flag = -1;
      const SmStatus status = s.fn().qxsmcke(m, x.data(), 1, &failed, &flag, mode, 1e-8);
      EXPECT_EQ(failed, status == SM_OK ? 0 : 1);
      EXPECT_EQ(flag, failed);
      return status;
    };
  };
  const auto answer = [&](SmMatrix*) { return failed; };
  for (const Shape shape : kSymmetricShapes) {
    SCOPED_TRACE(name_of(shape));
    EXPECT_GE(survives(
                  GetParam(), [&](Session& s) { return build(s, shape, kDefinite); }, check('G'), answer, is_no_memory),
              4);
  }
  EXPECT_EQ(survives(
                GetParam(), [&](Session& s) { return build(s, kGeneralSparse, identity(4)); }, check('H'), answer,
                is_no_memory),
            1);
}

TEST_P(GinvAllocationTest, checking_with_a_tied_record_that_has_no_pool) {
  for (const Shape shape : kPacked) {
    std::vector<double> data = laid_out(shape, kDefinite);
    const std::vector<double> x{1, 2, 3, 4};
    std::int64_t failed = 0;
    EXPECT_GE(survives(
                  GetParam(), [&](Session& s) { return new_tied(s, shape, data, 4, 4); },
                  [&](Session& s, SmMatrix* m) { return s.fn().qxsmcke(m, x.data(), 1, &failed, nullptr, 'G', 1e-8); },
                  [&](SmMatrix*) { return failed; }, is_no_memory),
              5);
  }
}

TEST_P(GinvAllocationTest, accumulating_an_open_source) {
  const std::int64_t requests = survives(
      GetParam(),
      [](Session& s) {
        return Pair{build_open(s, kDefinite), build_open(s, kDefinite)};
      },
      [](Session& s, Pair& p) {
        const SmStatus status = s.fn().qxsmAddSS(p.a, p.b, 2.0);
        EXPECT_EQ(p.b->state, status == SM_OK ? SM_STATE_CLOSED : SM_STATE_OPEN);
        EXPECT_TRUE(near(contents(p.a), scaled(kDefinite, status == SM_OK ? 3.0L : 1.0L), 0.0));
        return status;
      },
      [](Pair& p) { return row_major(contents(p.a)); }, is_no_memory);
  EXPECT_EQ(requests, 3) << "the three arrays of closing";
}

TEST_P(GinvAllocationTest, accumulating_into_a_full_slab_stops_at_the_entry_that_no_slab_follows) {
  Session session(GetParam());
  SmMatrix* a = nearly_full(session);
  SmMatrix* b = new_sized(session, kGeneralSparse, 21, 40);
  for (const std::int64_t c : {3, 5}) EXPECT_EQ(session.fn().qxsmassign(b, 20, c, 0, 7.0), SM_OK);
  EXPECT_EQ(session.fn().qxsmassign(b, 0, 0, 0, 2.0), SM_OK);
  session.host().fail_request(0, false);
  EXPECT_EQ(session.fn().qxsmAddSS(a, b, 1.0), SM_NO_MEMORY);
  EXPECT_EQ(session.host().stop_failing(), 1);
  const Nonzeros left = entries(a);
  EXPECT_EQ(left.at({0, 0}), 3.0);
  EXPECT_EQ(left.at({20, 3}), 7.0) << "what came before stays";
  EXPECT_EQ(left.count({20, 5}), 0U) << "nothing follows";
}

TEST_P(GinvAllocationTest, accumulating_onto_entries_that_are_there_needs_no_memory) {
  Session session(GetParam());
  SmMatrix* a = new_sized(session, kSymmetricSparse, 20, 20);
  for (std::int64_t r = 0; r < 20; ++r)
    for (std::int64_t c = r + 1; c < 20; ++c) EXPECT_EQ(session.fn().qxsmassign(a, r, c, 0, 1.0), SM_OK);
  SmMatrix* wide = new_sized(session, kSymmetricSparse, 20, 20);
  EXPECT_EQ(session.fn().qxsmclose(wide, 0.0), SM_OK);
  session.host().fail_request(0, true);
  EXPECT_EQ(session.fn().qxsmAddSS(a, wide, 1.0), SM_OK) << "old keys need no memory";
  EXPECT_EQ(session.host().stop_failing(), 0);
}

TEST_P(GinvAllocationTest, adding_with_a_block_to_save) {
  for (const Shape g_shape : kSymmetricShapes)
    for (const Shape p_shape : {kGeneralSparse, kGeneralColumns, kSymmetricSparse, kSymmetricRows}) {
      SCOPED_TRACE(name_of(g_shape) + " saved into " + name_of(p_shape));
      const std::int64_t requests = survives(
          GetParam(),
          [&](Session& s) {
            SmMatrix* p = nullptr;
            EXPECT_EQ(s.fn().qxsmnew(s.instance(), &p, p_shape.kind, p_shape.format), SM_OK);
            SmMatrix* g = is_sparse(g_shape) ? build_open(s, kDefinite) : build(s, g_shape, kDefinite);
            return Pair{g, build(s, kDiagonalRows, from_diagonal({1, 2})), p};
          },
          [&](Session&, Pair& p) {
            const SmStatus status = qxsmAddGinv(p.a, p.b, p.p, 2, 1.0, 0.0);
            if (status != SM_OK) {
              EXPECT_TRUE(near(contents(p.a), kDefinite, 0.0)) << "G is as it was";
            }
            return status;
          },
          [](Pair& p) {
            std::vector<double> all = row_major(contents(p.a));
            const std::vector<double> saved = row_major(contents(p.p));
            all.insert(all.end(), saved.begin(), saved.end());
            return all;
          },
          is_no_memory);
      EXPECT_GE(requests, 1);
    }
}

TEST_P(GinvAllocationTest, adding_needs_no_memory_without_a_block_to_save) {
  for (const Shape shape : {kSymmetricSparse, kSymmetricColumns, kSymmetricRows, kDiagonalColumns, kDiagonalRows})
    for (const bool factored : {false, true}) {
      Session s(GetParam());
      SmMatrix* g =
          shape.kind == SM_KIND_SYMMETRIC && is_sparse(shape) ? build_open(s, kDefinite) : build(s, shape, kDefinite);
      if (factored && !is_sparse(shape)) {
        ASSERT_EQ(s.fn().qxsmfact(g, 0), SM_OK);
      }
      SmMatrix* b = build(s, kDiagonalRows, from_diagonal({1, 1, 1, 1}));
      s.host().fail_request(0, true);
      EXPECT_EQ(qxsmAddGinv(g, b, nullptr, 0, 1.0, 1e-8), SM_OK) << name_of(shape);
      EXPECT_EQ(s.host().stop_failing(), 0);
    }
}

TEST_P(GinvAllocationTest, inverting) {
  for (const Shape shape : kSquareFactored)
    for (const std::int16_t in_place : {std::int16_t{0}, std::int16_t{1}})
      for (const bool factored : {false, true}) {
        SCOPED_TRACE(name_of(shape) + " in place " + std::to_string(in_place));
        const std::int64_t requests = survives(
            GetParam(),
            [&](Session& s) {
              SmMatrix* m = build(s, shape, kDefinite);
              if (factored) {
                EXPECT_EQ(s.fn().qxsmfact(m, 0), SM_OK);
              }
              return m;
            },
            [&](Session& s, SmMatrix* m) {
              const std::int32_t state = m->state;
              const SmStatus status = s.fn().qxsminv(m, in_place, kNan);
              EXPECT_EQ(m->state, status == SM_OK ? SM_STATE_INVERTED + 0 : state);
              if (status != SM_OK && !factored) {
                EXPECT_EQ(doubles(m->values, m->nnz), laid_out(shape, kDefinite)) << "the values";
              }
              return status;
            },
            [](SmMatrix* m) {
              std::vector<double> all = row_major(contents(m, m->dense_factor));
              all.push_back(m->log_det);
              all.push_back(static_cast<double>(m->rank));
              return all;
            },
            is_no_memory);
        EXPECT_GE(requests, in_place || factored ? 0 : 1);
        if (shape.kind == SM_KIND_DIAGONAL) {
          EXPECT_EQ(requests, in_place || factored ? 0 : 1);
        }
      }
}

TEST_P(GinvAllocationTest, inverting_a_tied_record_that_has_no_pool) {
  for (const Shape shape : kSquareFactored) {
    std::vector<double> data = laid_out(shape, kDefinite);
    EXPECT_GE(survives(
                  GetParam(), [&](Session& s) { return new_tied(s, shape, data, 4, 4); },
                  [](Session& s, SmMatrix* m) { return s.fn().qxsminv(m, 0, kNan); },
                  [](SmMatrix* m) { return row_major(contents(m, m->dense_factor)); }, is_no_memory),
              2);
    EXPECT_EQ(data, laid_out(shape, kDefinite));
  }
}

TEST_P(GinvAllocationTest, hermite_forms) {
  for (const Shape shape : kInvertible)
    for (const Shape h_shape : kGeneralShapes)
      for (const bool typed_only : {false, true}) {
        SCOPED_TRACE(name_of(shape) + " into " + name_of(h_shape) + (typed_only ? " without a size" : ""));
        const bool packed = shape.kind == SM_KIND_SYMMETRIC && !is_sparse(shape);
        bool complete = false;
        const std::int64_t requests = survives(
            GetParam(),
            [&](Session& s) {
              SmMatrix* h = typed_only ? new_typed(s, h_shape) : new_sized(s, h_shape, 4, 4);
              return Pair{build(s, shape, kDefinite), h};
            },
            [&](Session& s, Pair& p) {
              const SmStatus status = s.fn().qxsmhermite(p.a, p.b);
              complete = near(contents(p.b), product(inverse(contents(p.a)), contents(p.a)), 1e-12);
              return status;
            },
            [](Pair& p) { return row_major(contents(p.b)); },
            [&](SmStatus status) {
              if (status == SM_OK) return complete;  // H is sized a second time
              return status == SM_NO_MEMORY || (shape.kind == SM_KIND_DIAGONAL && status == SM_NO_ELEMENT);
            },
            packed ? 1 : 0);  // a record whose pool was refused stays registered
        EXPECT_GE(requests, 1);
      }
}

TEST_P(GinvAllocationTest, a_refused_request_while_a_diagonal_matrix_is_inverted_answers_123) {
  Session s(GetParam());
  SmMatrix* a = build(s, kDiagonalRows, from_diagonal({4, 9}));
  SmMatrix* h = new_sized(s, kGeneralRows, 2, 2);  // it has its size: the inverse is the first request
  s.host().fail_request(0, false);
  EXPECT_EQ(s.fn().qxsmhermite(a, h), SM_NO_ELEMENT);
  EXPECT_EQ(s.host().stop_failing(), 1);
  EXPECT_EQ(a->state, SM_STATE_CLOSED);
}

TEST_P(GinvAllocationTest, work_for_orthogonalising) {
  for (const std::int64_t k : {0, 1}) {
    Session s(GetParam());
    SmMatrix* m = build(s, kGeneralSparse, kDefinite);
    std::vector<std::int16_t> active(4, 1);
    const Snapshot before = snapshot(m);
    const std::int64_t blocks = s.host().live_blocks();
    s.host().fail_request(k, false);
    EXPECT_EQ(qxsmorth(m, active.data(), 0, 0, 1e-12), SM_NO_MEMORY);
    EXPECT_EQ(s.host().stop_failing(), 1);
    EXPECT_TRUE(snapshot(m) == before);
    EXPECT_EQ(active, (std::vector<std::int16_t>(4, 1)));
    EXPECT_EQ(s.host().live_blocks(), blocks);
    EXPECT_EQ(qxsmorth(m, active.data(), 0, 0, 1e-12), SM_OK);
    EXPECT_EQ(active, (std::vector<std::int16_t>(4, 0)));
  }
}

TEST_P(GinvAllocationTest, orthogonalising_without_a_slab_for_the_new_nodes) {
  for (const bool for_ever : {false, true}) {
    Session s(GetParam());
    s.instance()->tolerances[0] = 1e300;
    Random random(7);
    SmMatrix* m = build(s, kGeneralSparse, random_dense(random, 20, 20));  // 400 nodes: a slab
    std::vector<std::int16_t> active(20, 1);
    const std::int64_t blocks = s.host().live_blocks();
    s.host().fail_request(2, for_ever);
    EXPECT_EQ(qxsmorth(m, active.data(), 0, 0, 1e-30), SM_NO_MEMORY);
    EXPECT_GE(s.host().stop_failing(), 1);
    EXPECT_LE(s.host().live_blocks(), blocks) << "the work vectors are given back";
    EXPECT_EQ(static_cast<std::int64_t>(entries(m).size()), m->nnz);
    s.close();
    EXPECT_EQ(s.host().live_blocks(), 0);
    EXPECT_EQ(s.host().violations(), 0);
  }
}

}  // namespace
}  // namespace sm::test
