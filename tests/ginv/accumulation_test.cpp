// qxsmAddSS: A <- A + s B.
#include "ginv/ginv_support.hpp"

namespace sm::test {
namespace {

constexpr double kScales[] = {1.0, -1.0, 2.5, -0.375};

class AccumulationTest : public ModuleTest {
 protected:
  SmStatus add(SmMatrix* a, SmMatrix* b, double s = 2.0) { return fn().qxsmAddSS(a, b, s); }
  SmMatrix* with(Shape shape, const Dense& a) { return build(session(), shape, a); }
  SmMatrix* open(const Dense& a) { return build_open(session(), a); }
  // Answers the status of a refusal that must leave both as they were.
  SmStatus refused(SmMatrix* a, SmMatrix* b, double s = 2.0) {
    const Snapshot before_a = snapshot(a);
    const Snapshot before_b = snapshot(b);
    const SmStatus status = add(a, b, s);
    EXPECT_TRUE(snapshot(a) == before_a);
    EXPECT_TRUE(snapshot(b) == before_b);
    return status;
  }
};
INSTANTIATE_BOTH_HOSTS(AccumulationTest);

TEST_P(AccumulationTest, general_sparse_matrices_add_up_and_the_target_grows_to_cover_the_source) {
  Random random(61);
  for (const double s : kScales)
    for (const auto& [rows, cols] : {std::pair{5, 7}, {3, 3}, {30, 4}, {2, 41}}) {
      const Dense a = random_dense(random, 5, 7, 40);
      const Dense b = random_dense(random, rows, cols, 30);
      SmMatrix* target = with(kGeneralSparse, a);
      SmMatrix* source = with(kGeneralSparse, b);
      const Snapshot before = snapshot(source);
      ASSERT_EQ(add(target, source, s), SM_OK);
      Nonzeros want;
      for (std::int64_t r = 0; r < 5; ++r)
        for (std::int64_t c = 0; c < 7; ++c)
          if (a(r, c) != 0.0L) want[{r, c}] = static_cast<double>(a(r, c));
      for (const auto& [place, value] : entries(source)) want[place] += s * value;
      EXPECT_EQ(entries(target), want);
      EXPECT_TRUE(snapshot(source) == before);
      EXPECT_GE(target->rows, 5);
      EXPECT_GE(target->cols, 7);
    }
}

TEST_P(AccumulationTest, a_general_target_grows_just_as_far_as_the_stored_entries) {
  SmMatrix* target = with(kGeneralSparse, from_rows({{1, 2}}));
  SmMatrix* source = new_sized(session(), kGeneralSparse, 50, 50);
  ASSERT_EQ(fn().qxsmassign(source, 40, 9, 0, 3.0), SM_OK);
  ASSERT_EQ(add(target, source, 0.5), SM_OK);
  EXPECT_EQ(target->rows, 41);
  EXPECT_EQ(target->cols, 10);
  EXPECT_EQ(entries(target), (Nonzeros{{{0, 0}, 1.0}, {{0, 1}, 2.0}, {{40, 9}, 1.5}}));
}

TEST_P(AccumulationTest, general_sparse_matrices_may_be_unsized_or_without_entries) {
  SmMatrix* nothing = new_sized(session(), kGeneralSparse, 4, 4);
  SmMatrix* some = with(kGeneralSparse, from_rows({{1, 0}, {0, 2}}));
  const Nonzeros two{{{0, 0}, 1.0}, {{1, 1}, 2.0}};
  EXPECT_EQ(add(some, nothing), SM_OK);
  EXPECT_EQ(entries(some), two);
  EXPECT_EQ(add(nothing, some, 1.0), SM_OK);
  EXPECT_EQ(entries(nothing), two);
}

TEST_P(AccumulationTest, diagonal_matrices_add_up_over_the_elements_of_the_source) {
  for (const Shape target_shape : kDiagonalShapes)
    for (const Shape source_shape : kDiagonalShapes)
      for (const double s : kScales) {
        SmMatrix* a = with(target_shape, from_diagonal({1, 2, 3, 4}));
        SmMatrix* b = with(source_shape, from_diagonal({8, 0, -16}));
        ASSERT_EQ(add(a, b, s), SM_OK);
        EXPECT_EQ(doubles(a->values, 4), (std::vector<double>{1 + 8 * s, 2, 3 - 16 * s, 4}));
        EXPECT_EQ(a->state, SM_STATE_CLOSED);
      }
}

TEST_P(AccumulationTest, packed_matrices_add_up_in_storage_order) {
  Random random(62);
  for (const Shape shape : kPacked)
    for (const std::int64_t m : {5, 3, 1})
      for (const double s : kScales) {
        const Dense a = random_symmetric(random, 5);
        SmMatrix* target = with(shape, a);
        SmMatrix* source = with(shape, random_symmetric(random, m));
        std::vector<double> want = laid_out(shape, a);
        for (std::int64_t k = 0; k < m * (m + 1) / 2; ++k) want[at(k)] += s * source->values[k];
        ASSERT_EQ(add(target, source, s), SM_OK);
        EXPECT_EQ(doubles(target->values, 15), want) << name_of(shape) << ' ' << m;
      }
}

TEST_P(AccumulationTest, a_smaller_source_meets_the_leading_block_in_format_22_and_not_in_format_23) {
  const Dense b = from_rows({{10, 20}, {20, 30}});
  SmMatrix* columns = with(kSymmetricColumns, Dense(3, 3));
  ASSERT_EQ(add(columns, with(kSymmetricColumns, b), 1.0), SM_OK);
  EXPECT_TRUE(near(contents(columns), from_rows({{10, 20, 0}, {20, 30, 0}, {0, 0, 0}}), 0.0));
  SmMatrix* rows = with(kSymmetricRows, Dense(3, 3));
  ASSERT_EQ(add(rows, with(kSymmetricRows, b), 1.0), SM_OK);
  EXPECT_TRUE(near(contents(rows), from_rows({{10, 20, 30}, {20, 0, 0}, {30, 0, 0}}), 0.0));
}

TEST_P(AccumulationTest, an_open_symmetric_sparse_target_takes_a_source_in_any_state) {
  Random random(63);
  const Dense a = random_symmetric(random, 7, 40);
  const Problem problem = positive_definite(random_graph(random, 6, 50), random);
  for (const double s : kScales)
    for (std::int32_t state = SM_STATE_OPEN; state <= SM_STATE_FACTORED; ++state) {
      SmMatrix* target = open(a);
      SmMatrix* source = new_sparse(session(), problem, state > SM_STATE_OPEN);
      ASSERT_EQ(bring_to(source, state), SM_OK);
      ASSERT_EQ(add(target, source, s), SM_OK);
      Dense want = a;
      for (const Entry& e : problem.upper) {
        want(e.row, e.col) += s * e.value;
        want(e.col, e.row) = want(e.row, e.col);
      }
      EXPECT_TRUE(near(contents(target), want, 0.0)) << "state " << state;
      EXPECT_EQ(target->state, SM_STATE_OPEN);
      EXPECT_EQ(source->state, std::max(state, SM_STATE_CLOSED + 0));
      EXPECT_TRUE(near(contents(source), problem.dense(), 0.0));
      EXPECT_EQ(fn().qxsmassign(target, 0, 6, 0, 1.0), SM_OK) << "it still takes entries";
    }
}

TEST_P(AccumulationTest, an_entry_below_the_diagonal_of_a_reordered_source_goes_above_the_targets) {
  SmMatrix* source = new_sparse(session(), problem_of({{4, 0, 0}, {0, 4, 1}, {0, 1, 4}}));
  ASSERT_EQ(qxsmmd(source), SM_OK);
  impose_order(source, {2, 1, 0});
  ASSERT_EQ(qxsmreorder(source), SM_OK);
  SmMatrix* target = open(Dense(3, 3));
  ASSERT_EQ(add(target, source, 3.0), SM_OK);
  EXPECT_EQ(entries(target), (Nonzeros{{{0, 0}, 12.0}, {{1, 1}, 12.0}, {{2, 2}, 12.0}, {{1, 2}, 3.0}}));
}

// A count of entries that no matrix can exceed takes no new ones, while those that are there are still added to.
TEST_P(AccumulationTest, an_entry_without_a_place_does_not_stop_the_others_and_the_last_answer_is_told) {
  const Dense b = from_rows({{1, 7, 0}, {7, 2, 0}, {0, 0, 3}});
  SmMatrix* target = open(from_diagonal({10, 20, 30}));
  target->nnz = SM_MAX_ELEMENTS;
  EXPECT_EQ(add(target, with(kSymmetricSparse, b), 1.0), SM_OK) << "the last one has its place";
  target->nnz = 3;
  EXPECT_EQ(entries(target), (Nonzeros{{{0, 0}, 11.0}, {{1, 1}, 22.0}, {{2, 2}, 33.0}}));
  SmMatrix* grown = open(from_diagonal({10, 20}));
  ASSERT_EQ(fn().qxsmassign(grown, 0, 2, 0, 5.0), SM_OK);  // row 2 comes in without a diagonal
  grown->nnz = SM_MAX_ELEMENTS;
  EXPECT_EQ(add(grown, with(kSymmetricSparse, b), 1.0), SM_TOO_LARGE) << "the last one has none";
  grown->nnz = 3;
  EXPECT_EQ(entries(grown), (Nonzeros{{{0, 0}, 11.0}, {{0, 2}, 5.0}, {{1, 1}, 22.0}}));
}

TEST_P(AccumulationTest, closing_the_source_drops_nothing) {
  SmMatrix* source = open(from_rows({{4, 1e-200}, {1e-200, 4}}));
  ASSERT_EQ(fn().qxsmassign(source, 0, 0, 0, 0.0), SM_OK);
  SmMatrix* wide = open(Dense(3, 3));
  ASSERT_EQ(fn().qxsmassign(source, 0, 1, 0, -0.0), SM_OK);
  ASSERT_EQ(add(wide, source), SM_OK);
  EXPECT_EQ(source->nnz, 3);
  EXPECT_EQ(compressed(source).count({0, 1}), 1U);
  EXPECT_EQ(entries(wide).count({0, 1}), 1U) << "a stored zero makes an entry";
  EXPECT_EQ(wide->nnz, 4);
}

TEST_P(AccumulationTest, a_matrix_may_be_added_to_itself) {
  Random random(64);
  for (const double s : kScales) {
    const Dense g = random_dense(random, 4, 6, 50);
    const Dense a = random_symmetric(random, 5, 50);
    SmMatrix* sparse = with(kGeneralSparse, g);
    SmMatrix* assembling = open(a);
    const std::int64_t nnz = assembling->nnz;
    for (SmMatrix* m : {sparse, assembling, with(kSymmetricColumns, a), with(kSymmetricRows, a)}) {
      const Dense want = scaled(contents(m), 1.0L + s);
      ASSERT_EQ(add(m, m, s), SM_OK) << name_of(shape_of(m));
      EXPECT_TRUE(near(contents(m), want, 0.0)) << name_of(shape_of(m)) << " times " << s;
    }
    EXPECT_EQ(assembling->state, SM_STATE_OPEN);
    EXPECT_EQ(assembling->nnz, nnz);
    EXPECT_EQ(fn().qxsmclose(assembling, 0.0), SM_OK);
    SmMatrix* diagonal = with(kDiagonalRows, from_diagonal({1, -2, 4}));
    ASSERT_EQ(add(diagonal, diagonal, s), SM_OK);
    EXPECT_EQ(doubles(diagonal->values, 3), (std::vector<double>{1 + s, -2 * (1 + s), 4 * (1 + s)}));
  }
  EXPECT_EQ(refused(with(kSymmetricSparse, from_diagonal({1})), with(kSymmetricSparse, from_diagonal({1}))),
            SM_ALREADY_CLOSED);
  SmMatrix* closed = with(kSymmetricSparse, from_diagonal({1}));
  EXPECT_EQ(refused(closed, closed), SM_ALREADY_CLOSED);
}

TEST_P(AccumulationTest, a_scale_of_0_is_done_before_any_check) {
  SmMatrix* general = with(kGeneralRows, from_rows({{1, 2, 3}}));
  SmMatrix* sparse = open(from_diagonal({1, 2}));
  SmMatrix* closed = with(kSymmetricSparse, from_diagonal({1, 2}));
  SmMatrix* none = new_untyped(session());
  for (const double zero : {0.0, -0.0})
    for (SmMatrix* a : {general, sparse, closed, none})
      for (SmMatrix* b : {general, sparse, closed, none}) EXPECT_EQ(refused(a, b, zero), SM_OK);
  EXPECT_EQ(sparse->state, SM_STATE_OPEN) << "an open source is not closed";
}

TEST_P(AccumulationTest, infinities_and_nans_are_multiplied_like_other_values) {
  SmMatrix* target = with(kDiagonalRows, from_diagonal({1, 1, 1}));
  ASSERT_EQ(add(target, with(kDiagonalRows, from_diagonal({0, kInfinity, 5})), kNan), SM_OK);
  for (int i = 0; i < 3; ++i) EXPECT_TRUE(std::isnan(target->values[i]));
  SmMatrix* packed = with(kSymmetricColumns, from_diagonal({1, 1}));
  ASSERT_EQ(add(packed, with(kSymmetricColumns, from_diagonal({kInfinity, 5})), 1.0), SM_OK);
  EXPECT_EQ(packed->values[0], kInfinity);
  EXPECT_EQ(packed->values[2], 6.0);
  SmMatrix* sparse = open(from_diagonal({1, 1}));
  ASSERT_EQ(add(sparse, with(kSymmetricSparse, from_diagonal({kInfinity, 5})), -1.0), SM_OK);
  EXPECT_EQ(entries(sparse), (Nonzeros{{{0, 0}, -kInfinity}, {{1, 1}, -4.0}}));
}

TEST_P(AccumulationTest, a_changed_target_loses_factor_rank_and_log_determinant) {
  const Dense a = from_rows({{4, 0}, {0, 9}});
  for (const Shape shape : kSquareFactored) {
    SCOPED_TRACE(name_of(shape));
    SmMatrix* b = with(shape, from_diagonal({1, 1}));
    const std::int64_t blocks = host().live_blocks();
    SmMatrix* factored = with(shape, a);
    ASSERT_EQ(fn().qxsmfact(factored, 0), SM_OK);
    SmMatrix* inverted = with(shape, a);
    ASSERT_EQ(fn().qxsminv(inverted, 0, kNan), SM_OK);
    for (SmMatrix* m : {factored, inverted}) {
      ASSERT_EQ(add(m, b, 1.0), SM_OK);
      EXPECT_EQ(m->state, SM_STATE_CLOSED);
      EXPECT_EQ(m->dense_factor, nullptr);
      expect_voided(m);
      EXPECT_TRUE(near(contents(m), from_diagonal({5, 10}), 0.0));
      double log_det = 0.0;
      EXPECT_EQ(fn().qxsmlogdet(m, &log_det), SM_OK);
      EXPECT_NEAR(log_det, std::log(50.0), 1e-14);
    }
    SmMatrix* in_place = with(shape, a);
    ASSERT_EQ(fn().qxsmfact(in_place, 1), SM_OK);
    ASSERT_EQ(add(in_place, b, 1.0), SM_OK);
    EXPECT_EQ(in_place->state, SM_STATE_FACTORED);
    EXPECT_TRUE(near(contents(in_place), from_diagonal({3, 4}), 0.0));
    expect_voided(in_place);
    for (SmMatrix* m : {factored, inverted, in_place}) EXPECT_EQ(fn().qxsmDestroyMatrix(instance(), &m), SM_OK);
    EXPECT_EQ(host().live_blocks(), blocks);
  }
}

TEST_P(AccumulationTest, a_tied_target_is_changed_where_it_lies_and_never_freed) {
  for (const Shape shape : kSquareFactored) {
    std::vector<double> data = laid_out(shape, from_rows({{4, 1}, {1, 9}}));
    const std::vector<double> before = data;
    SmMatrix* target = new_tied(session(), shape, data, 2, 2);
    SmMatrix* source = with(shape, from_rows({{1, 2}, {2, 3}}));
    ASSERT_EQ(fn().qxsmfact(target, 0), SM_OK);
    ASSERT_EQ(add(target, source, 2.0), SM_OK);
    for (std::size_t k = 0; k < data.size(); ++k) EXPECT_EQ(data[k], before[k] + 2 * source->values[k]);
    EXPECT_EQ(target->values, data.data());
    EXPECT_EQ(target->dense_factor, nullptr);
    std::vector<double> open_data = before;
    SmMatrix* open_target = new_open_tied(session(), open_data, 2, 2, shape.kind, shape.format);
    EXPECT_EQ(add(open_target, source, 2.0), SM_OK) << "neither has to be closed";
    EXPECT_EQ(open_data, data);
    EXPECT_EQ(open_target->state, SM_STATE_OPEN);
  }
}

TEST_P(AccumulationTest, refuses_a_target_that_nothing_is_added_to) {
  const Dense five = from_diagonal({1, 2, 3, 4, 5});
  for (const Shape shape : kShapes) {
    SmMatrix* b = with(shape, five);
    EXPECT_EQ(refused(new_untyped(session()), b), SM_UNAVAILABLE) << name_of(shape);
    SmMatrix* none = new_untyped_with_an_entry(session());
    EXPECT_EQ(refused(none, b), SM_UNAVAILABLE);
    if (shape.kind != SM_KIND_GENERAL || !is_sparse(shape)) {
      EXPECT_EQ(refused(with(kGeneralSparse, five), b), SM_KIND_MISMATCH) << name_of(shape);
    }
    EXPECT_EQ(refused(with(kGeneralColumns, five), b), SM_KIND_MISMATCH) << name_of(shape);
    EXPECT_EQ(refused(with(kGeneralRows, five), b), SM_KIND_MISMATCH) << name_of(shape);
  }
  EXPECT_EQ(refused(with(kGeneralSparse, five), new_untyped(session())), SM_KIND_MISMATCH);
}

TEST_P(AccumulationTest, refuses_a_diagonal_target_by_size_and_then_by_kind) {
  const Dense four = from_diagonal({1, 2, 3, 4});
  const Dense three = from_diagonal({1, 2, 3});
  for (const Shape target : kDiagonalShapes)
    for (const Shape shape : kShapes) {
      SCOPED_TRACE(name_of(shape));
      SmMatrix* a = with(target, three);
      EXPECT_EQ(refused(a, with(shape, four)), SM_DIMENSION_MISMATCH);
      if (shape.kind != SM_KIND_DIAGONAL) {
        EXPECT_EQ(refused(a, with(shape, three)), SM_UNAVAILABLE);
      }
    }
}

TEST_P(AccumulationTest, refuses_a_symmetric_target_by_size_then_by_state_then_by_kind) {
  const Dense four = from_diagonal({1, 2, 3, 4});
  const Dense three = from_diagonal({1, 2, 3});
  for (const Shape shape : kShapes) {
    SCOPED_TRACE(name_of(shape));
    SmMatrix* large = with(shape, four);
    SmMatrix* fitting = with(shape, three);
    SmMatrix* closed = with(kSymmetricSparse, three);
    EXPECT_EQ(refused(open(three), large), SM_DIMENSION_MISMATCH);
    EXPECT_EQ(refused(closed, large), SM_DIMENSION_MISMATCH);
    EXPECT_EQ(refused(closed, fitting), SM_ALREADY_CLOSED);
    if (shape.kind != SM_KIND_SYMMETRIC || !is_sparse(shape)) {
      EXPECT_EQ(refused(open(three), fitting), SM_KIND_MISMATCH);
    }
    for (const Shape target : kPacked) {
      EXPECT_EQ(refused(with(target, three), large), SM_DIMENSION_MISMATCH);
      if (shape.kind != SM_KIND_SYMMETRIC || shape.format != target.format) {
        EXPECT_EQ(refused(with(target, three), fitting), SM_KIND_MISMATCH);
      }
    }
  }
  EXPECT_EQ(refused(open(three), open(four)), SM_DIMENSION_MISMATCH);
}

TEST_P(AccumulationTest, operands_whose_values_could_not_be_had_answer_104) {
  for (const Shape shape : kSquareFactored) {
    SmMatrix* missing = new_without_values(session(), shape, 2);
    SmMatrix* there = with(shape, from_diagonal({1, 2}));
    EXPECT_EQ(refused(there, missing), SM_BAD_ARGUMENT) << name_of(shape);
    EXPECT_EQ(refused(missing, there), SM_BAD_ARGUMENT) << name_of(shape);
  }
}

TEST_P(AccumulationTest, an_empty_source_adds_nothing) {
  for (const Shape shape : kSquareFactored) {
    SmMatrix* a = with(shape, from_diagonal({1, 2}));
    EXPECT_EQ(add(a, with(shape, Dense(0, 0))), SM_OK) << name_of(shape);
    EXPECT_TRUE(near(contents(a), from_diagonal({1, 2}), 0.0));
  }
  SmMatrix* a = open(from_diagonal({1, 2}));
  SmMatrix* empty = open(Dense(0, 0));
  EXPECT_EQ(add(a, empty), SM_OK);
  EXPECT_EQ(empty->state, SM_STATE_CLOSED) << "an open source is closed first";
  EXPECT_EQ(entries(a), (Nonzeros{{{0, 0}, 1.0}, {{1, 1}, 2.0}}));
}

}  // namespace
}  // namespace sm::test
