// qxsmAddGinv: s B added into the trailing block of G, whose old elements go to P.
#include "ginv/ginv_support.hpp"

namespace sm::test {
namespace {

using Index = std::int64_t;
constexpr double kScales[] = {1.0, -2.5, 0.375};
// What may be added to a symmetric matrix.
constexpr Shape kAddends[] = {kSymmetricSparse, kSymmetricColumns, kSymmetricRows, kDiagonalColumns, kDiagonalRows};

class AdditionTest : public ModuleTest {
 protected:
  SmMatrix* with(Shape shape, const Dense& a) { return build(session(), shape, a); }
  SmMatrix* open(const Dense& a) { return build_open(session(), a); }
  SmStatus add(SmMatrix* g, SmMatrix* b, Index off = 0, double s = 1.0, double tolerance = 0.0, SmMatrix* p = nullptr) {
    return qxsmAddGinv(g, b, p, off, s, tolerance);
  }
};
INSTANTIATE_BOTH_HOSTS(AdditionTest);

// s B added into `g` from (off, off), over what the shape of B holds.
Dense added(Dense g, const Dense& b, Index off, double s, bool diagonal = false) {
  for (Index i = 0; i < b.rows(); ++i)
    for (Index j = 0; j < b.cols(); ++j)
      if (!diagonal || i == j) g(off + i, off + j) += s * b(i, j);
  return g;
}

// Elements from (off, off) at or below the tolerance as 0.
Dense dropped(Dense g, Index off, double tolerance) {
  for (Index i = off; i < g.rows(); ++i)
    for (Index j = off; j < g.cols(); ++j)
      if (std::fabs(g(i, j)) <= tolerance) g(i, j) = 0.0L;
  return g;
}

Dense upper(Dense a) {
  for (Index i = 0; i < a.rows(); ++i)
    for (Index j = 0; j < i; ++j) a(i, j) = 0.0L;
  return a;
}

TEST_P(AdditionTest, a_general_sparse_block_is_shifted_and_scaled) {
  Random random(81);
  for (const Index off : {0, 1, 3})
    for (const double s : kScales) {
      const Dense g = random_dense(random, 9, 9, 40);
      const Dense b = random_dense(random, 5, 6, 40);
      SmMatrix* target = with(kGeneralSparse, g);
      SmMatrix* source = with(kGeneralSparse, b);
      const Snapshot before = snapshot(source);
      Nonzeros want = entries(target);
      for (const auto& [place, value] : entries(source)) want[{place.first + off, place.second + off}] += s * value;
      SmMatrix* p = with(kGeneralSparse, from_rows({{1, 2}}));
      const Snapshot p_before = snapshot(p);
      ASSERT_EQ(add(target, source, off, s, 0.0, p), SM_OK);
      EXPECT_EQ(entries(target), want) << "off " << off;
      EXPECT_TRUE(snapshot(source) == before);
      EXPECT_TRUE(snapshot(p) == p_before) << "the general road saves nothing";
    }
}

TEST_P(AdditionTest, a_general_target_grows_to_cover_the_shifted_block) {
  SmMatrix* g = with(kGeneralSparse, from_rows({{1, 2}}));
  ASSERT_EQ(add(g, with(kGeneralSparse, from_rows({{0, 3}, {4, 0}})), 30, 2.0), SM_OK);
  EXPECT_EQ(entries(g), (Nonzeros{{{0, 0}, 1.0}, {{0, 1}, 2.0}, {{30, 31}, 6.0}, {{31, 30}, 8.0}}));
  EXPECT_EQ(g->rows, 32);
  EXPECT_EQ(g->cols, 32);
}

TEST_P(AdditionTest, a_diagonal_block_is_added_and_the_old_elements_saved) {
  for (const Shape g_shape : kDiagonalShapes)
    for (const Shape b_shape : kDiagonalShapes)
      for (const Index off : {0, 1, 2}) {
        SmMatrix* g = with(g_shape, from_diagonal({1, 2, 3, 4}));
        SmMatrix* b = with(b_shape, from_diagonal({10, 20}));
        SmMatrix* p = with(kDiagonalRows, from_diagonal({7, 7, 7}));
        ASSERT_EQ(add(g, b, off, 0.5, 0.0, p), SM_OK);
        std::vector<double> want{1, 2, 3, 4};
        want[at(off)] += 5;
        want[at(off + 1)] += 10;
        EXPECT_EQ(doubles(g->values, 4), want);
        EXPECT_EQ(doubles(p->values, 3),
                  (std::vector<double>{1.0 + static_cast<double>(off), 2.0 + static_cast<double>(off), 7}));
        ASSERT_EQ(add(g, b, off, -0.5), SM_OK) << "without P";
        EXPECT_EQ(doubles(g->values, 4), (std::vector<double>{1, 2, 3, 4}));
      }
}

TEST_P(AdditionTest, the_old_diagonal_may_be_saved_into_any_matrix_that_has_the_places) {
  for (const Shape shape : kShapes) {
    if (shape.kind == SM_KIND_SYMMETRIC && is_sparse(shape)) continue;
    SmMatrix* p = new_sized(session(), shape, 3, 3);
    ASSERT_EQ(
        add(with(kDiagonalRows, from_diagonal({1, 2, 3})), with(kDiagonalRows, from_diagonal({5, 5})), 1, 1.0, 0.0, p),
        SM_OK);
    EXPECT_TRUE(near(contents(p), from_diagonal({2, 3, 0}), 0.0)) << name_of(shape);
  }
  SmMatrix* p = new_sized(session(), kSymmetricSparse, 2, 2);
  ASSERT_EQ(add(with(kDiagonalRows, from_diagonal({1, 2})), with(kDiagonalRows, from_diagonal({5, 5})), 0, 1.0, 0.0, p),
            SM_OK);
  EXPECT_EQ(entries(p), (Nonzeros{{{0, 0}, 1.0}, {{1, 1}, 2.0}}));
  EXPECT_EQ(p->state, SM_STATE_OPEN);
}

TEST_P(AdditionTest, a_packed_target_takes_every_symmetric_and_diagonal_addend) {
  Random random(82);
  for (const Shape g_shape : kPacked)
    for (const Shape b_shape : kAddends)
      for (const Index off : {0, 2, 4})
        for (const double s : kScales) {
          const Dense g = random_symmetric(random, 5);
          const Dense b = random_symmetric(random, 5 - off, 50);
          SmMatrix* target = with(g_shape, g);
          SmMatrix* source = with(b_shape, b);
          const Snapshot before = snapshot(source);
          SmMatrix* p = new_sized(session(), kGeneralRows, 2, 3);
          ASSERT_EQ(add(target, source, off, s, 0.0, p), SM_OK);
          const Dense want = added(g, b, off, s, b_shape.kind == SM_KIND_DIAGONAL);
          EXPECT_TRUE(near(contents(target), want, 0.0)) << name_of(g_shape) << ", " << name_of(b_shape) << ' ' << off;
          EXPECT_TRUE(near(contents(p), upper(trailing(g, off)), 0.0)) << "the old upper triangle";
          EXPECT_TRUE(snapshot(source) == before);
          EXPECT_EQ(target->state, SM_STATE_CLOSED);
        }
}

TEST_P(AdditionTest, an_open_sparse_target_takes_every_symmetric_and_diagonal_addend) {
  Random random(83);
  for (const Shape b_shape : kAddends)
    for (const Index off : {0, 2, 4})
      for (const double s : kScales) {
        const Dense g = random_symmetric(random, 5, 50);
        const Dense b = random_symmetric(random, 5 - off, 50);
        SmMatrix* target = open(g);
        SmMatrix* source = with(b_shape, b);
        SmMatrix* p = new_sized(session(), kSymmetricRows, 1, 1);
        ASSERT_EQ(add(target, source, off, s, 0.0, p), SM_OK);
        const Dense want = added(g, b, off, s, b_shape.kind == SM_KIND_DIAGONAL);
        EXPECT_TRUE(near(contents(target), want, 0.0)) << name_of(b_shape) << ' ' << off;
        EXPECT_TRUE(near(contents(p), trailing(g, off), 0.0));
        EXPECT_EQ(target->state, SM_STATE_OPEN);
        EXPECT_EQ(fn().qxsmassign(target, 0, 4, 0, 1.0), SM_OK) << "it still takes entries";
      }
}

TEST_P(AdditionTest, a_sparse_addend_may_be_ordered_or_factored) {
  Random random(84);
  const Problem problem = positive_definite(random_graph(random, 6, 60), random);
  for (std::int32_t state = SM_STATE_CLOSED; state <= SM_STATE_FACTORED; ++state)
    for (const Shape shape : {kSymmetricSparse, kSymmetricColumns, kSymmetricRows}) {
      SmMatrix* b = new_sparse(session(), problem);
      ASSERT_EQ(bring_to(b, state), SM_OK);
      const Dense g = random_symmetric(random, 8);
      SmMatrix* target = is_sparse(shape) ? open(g) : with(shape, g);
      ASSERT_EQ(add(target, b, 2, -1.5), SM_OK);
      EXPECT_TRUE(near(contents(target), added(g, problem.dense(), 2, -1.5), 0.0)) << name_of(shape) << ' ' << state;
      EXPECT_EQ(b->state, state);
    }
}

TEST_P(AdditionTest, the_old_block_may_be_saved_into_every_shape_that_holds_a_triangle) {
  Random random(85);
  const Dense g = random_symmetric(random, 5);
  for (const Shape g_shape : {kSymmetricSparse, kSymmetricColumns, kSymmetricRows})
    for (const Shape p_shape :
         {kGeneralSparse, kGeneralColumns, kGeneralRows, kSymmetricSparse, kSymmetricColumns, kSymmetricRows})
      for (const Index off : {0, 2}) {
        SmMatrix* target = is_sparse(g_shape) ? open(g) : with(g_shape, g);
        SmMatrix* p = new_sized(session(), p_shape, 1, 1);
        ASSERT_EQ(
            add(target, with(kDiagonalRows, from_diagonal(std::vector<double>(at(5 - off), 1.0))), off, 1.0, 0.0, p),
            SM_OK);
        const Dense block = trailing(g, off);
        EXPECT_EQ(p->rows, 5 - off);
        EXPECT_EQ(p->cols, 5 - off);
        EXPECT_TRUE(near(contents(p), p_shape.kind == SM_KIND_GENERAL ? upper(block) : block, 0.0))
            << name_of(g_shape) << " into " << name_of(p_shape);
        EXPECT_EQ(p->state, p_shape.kind == SM_KIND_SYMMETRIC && is_sparse(p_shape) ? SM_STATE_OPEN : SM_STATE_CLOSED);
      }
}

TEST_P(AdditionTest, an_empty_block_behind_the_end_is_served) {
  for (const Shape shape : kPacked) {
    SmMatrix* g = with(shape, from_diagonal({1, 2}));
    SmMatrix* p = with(kSymmetricRows, from_diagonal({9}));
    EXPECT_EQ(add(g, with(shape, Dense(0, 0)), 2, 1.0, 0.0, p), SM_OK);
    EXPECT_TRUE(near(contents(g), from_diagonal({1, 2}), 0.0));
    EXPECT_EQ(p->rows, 0);
  }
}

// Small elements inside and outside the block, on the diagonal and off it.
Dense with_small_elements() { return from_rows({{1e-9, 2e-9, 1}, {2e-9, 3e-9, -4e-9}, {1, -4e-9, 1e-160}}); }

TEST_P(AdditionTest, a_tolerance_zeroes_what_is_small_in_the_block_and_unlinks_nothing) {
  const Dense g = with_small_elements();
  for (const Shape shape : {kSymmetricSparse, kSymmetricColumns, kSymmetricRows})
    for (const Index off : {0, 1})
      for (const double tolerance : {3e-9, 1e-8, 1e-170, kNan, 0.0, -1.0}) {
        SmMatrix* target = is_sparse(shape) ? open(g) : with(shape, g);
        const Index nnz = target->nnz;
        const Dense b(3 - off, 3 - off);
        ASSERT_EQ(add(target, with(kDiagonalRows, b), off, 1.0, tolerance), SM_OK);
        const double applied = std::isnan(tolerance) ? instance()->tolerances[3] : tolerance;
        EXPECT_TRUE(near(contents(target), applied > 0 ? dropped(g, off, applied) : g, 0.0))
            << name_of(shape) << " off " << off << " tolerance " << tolerance;
        EXPECT_EQ(target->nnz, nnz);
      }
}

TEST_P(AdditionTest, a_tolerance_zeroes_general_and_diagonal_blocks_too) {
  const Dense g = with_small_elements();
  for (const Index off : {0, 1})
    for (const double tolerance : {3e-9, kNan, 0.0}) {
      const double applied = std::isnan(tolerance) ? instance()->tolerances[3] : tolerance;
      SmMatrix* general = with(kGeneralSparse, g);
      const Index nnz = general->nnz;
      ASSERT_EQ(add(general, with(kGeneralSparse, from_rows({{0, 0}, {0, 0.5}})), off, 0.0, tolerance), SM_OK);
      const Dense want = applied > 0 ? dropped(g, off, applied) : g;
      EXPECT_TRUE(near(contents(general), want, 0.0)) << off << ' ' << tolerance;
      EXPECT_EQ(general->nnz, nnz);
      SmMatrix* diagonal = with(kDiagonalRows, from_diagonal({1e-9, 2e-9, 5, 1e-160}));
      ASSERT_EQ(add(diagonal, with(kDiagonalRows, from_diagonal({0, 1e-160})), off, 1.0, tolerance), SM_OK);
      const Dense was = from_diagonal({1e-9, 2e-9, 5, 1e-160});
      EXPECT_TRUE(near(contents(diagonal), applied > 0 ? dropped(was, off, applied) : was, 0.0))
          << off << ' ' << tolerance;
    }
}

TEST_P(AdditionTest, what_the_tolerance_changes_costs_the_factor_even_when_nothing_is_added) {
  const Dense g = from_rows({{4, 1e-9}, {1e-9, 9}});
  for (const Shape shape : kPacked)
    for (const double tolerance : {1e-8, 1e-10}) {
      SmMatrix* target = with(shape, g);
      ASSERT_EQ(fn().qxsmfact(target, 0), SM_OK);
      SmMatrix* nothing = new_without_values(session(), shape, 2);
      ASSERT_EQ(add(target, nothing, 0, 1.0, tolerance), SM_OK);
      if (tolerance < 1e-9) {
        EXPECT_EQ(target->state, SM_STATE_FACTORED) << "nothing is so small";
        EXPECT_EQ(target->rank, 2);
        continue;
      }
      EXPECT_TRUE(near(contents(target), from_diagonal({4, 9}), 0.0)) << name_of(shape);
      EXPECT_EQ(target->state, SM_STATE_CLOSED);
      EXPECT_EQ(target->dense_factor, nullptr);
      expect_voided(target);
    }
}

TEST_P(AdditionTest, the_tolerance_is_applied_to_the_sum) {
  for (const Shape shape : {kSymmetricSparse, kSymmetricColumns, kSymmetricRows}) {
    const Dense g = from_rows({{1, 2}, {2, 3}});
    SmMatrix* target = is_sparse(shape) ? open(g) : with(shape, g);
    SmMatrix* p = new_sized(session(), kSymmetricRows, 1, 1);
    ASSERT_EQ(add(target, with(kSymmetricRows, from_rows({{1, 2}, {2, 2.5}})), 0, -1.0, 0.5, p), SM_OK);
    EXPECT_TRUE(near(contents(target), Dense(2, 2), 0.0)) << "0, 0 and exactly the tolerance";
    EXPECT_TRUE(near(contents(p), g, 0.0));
  }
  SmMatrix* kept = with(kSymmetricRows, from_rows({{1, 2}, {2, 3}}));
  ASSERT_EQ(add(kept, with(kSymmetricRows, from_rows({{0, 0}, {0, 2}})), 0, -1.0, 0.5), SM_OK);
  EXPECT_TRUE(near(contents(kept), from_rows({{1, 2}, {2, 1}}), 0.0));
}

TEST_P(AdditionTest, a_nan_in_the_block_is_no_small_element) {
  SmMatrix* g = with(kSymmetricColumns, from_diagonal({1, 1}));
  ASSERT_EQ(add(g, with(kDiagonalRows, from_diagonal({1, 2})), 0, kNan, 1e300), SM_OK);
  EXPECT_TRUE(std::isnan(g->values[0]));
  EXPECT_TRUE(std::isnan(g->values[2]));
  EXPECT_EQ(g->values[1], 0.0);
}

TEST_P(AdditionTest, a_changed_target_loses_its_separate_array_rank_and_log_determinant) {
  for (const Shape shape : kSquareFactored) {
    SCOPED_TRACE(name_of(shape));
    SmMatrix* b = with(kDiagonalRows, from_diagonal({1, 1}));
    const Index blocks = host().live_blocks();
    SmMatrix* factored = with(shape, from_diagonal({4, 9}));
    ASSERT_EQ(fn().qxsmfact(factored, 0), SM_OK);
    SmMatrix* inverted = with(shape, from_diagonal({4, 9}));
    ASSERT_EQ(fn().qxsminv(inverted, 0, kNan), SM_OK);
    for (SmMatrix* m : {factored, inverted}) {
      ASSERT_EQ(add(m, b), SM_OK);
      EXPECT_EQ(m->state, SM_STATE_CLOSED);
      EXPECT_EQ(m->dense_factor, nullptr);
      expect_voided(m);
      double log_det = 0.0;
      EXPECT_EQ(fn().qxsmlogdet(m, &log_det), SM_OK);
      EXPECT_NEAR(log_det, std::log(50.0), 1e-14);
    }
    SmMatrix* in_place = with(shape, from_diagonal({4, 9}));
    ASSERT_EQ(fn().qxsmfact(in_place, 1), SM_OK);
    ASSERT_EQ(add(in_place, b), SM_OK);
    EXPECT_EQ(in_place->state, SM_STATE_FACTORED);
    EXPECT_TRUE(near(contents(in_place), from_diagonal({3, 4}), 0.0));
    expect_voided(in_place);
    for (SmMatrix* m : {factored, inverted, in_place}) EXPECT_EQ(fn().qxsmDestroyMatrix(instance(), &m), SM_OK);
    EXPECT_EQ(host().live_blocks(), blocks);
  }
}

TEST_P(AdditionTest, a_tied_target_is_changed_where_it_lies_and_never_freed) {
  for (const Shape shape : kSquareFactored)
    for (const bool closed : {true, false}) {
      std::vector<double> data = laid_out(shape, from_diagonal({4, 9}));
      SmMatrix* g = closed ? new_tied(session(), shape, data, 2, 2)
                           : new_open_tied(session(), data, 2, 2, shape.kind, shape.format);
      if (closed) {
        ASSERT_EQ(fn().qxsmfact(g, 0), SM_OK);
      }
      ASSERT_EQ(add(g, with(kDiagonalRows, from_diagonal({1, 2})), 0, 3.0), SM_OK);
      EXPECT_EQ(data, laid_out(shape, from_diagonal({7, 15}))) << name_of(shape);
      EXPECT_EQ(g->values, data.data());
      EXPECT_EQ(g->dense_factor, nullptr);
    }
}

}  // namespace
}  // namespace sm::test
