// qxsmDenseQuad: G S G' for a packed array S between sparse rows.
#include <cmath>

#include "forms/forms_support.hpp"

namespace sm::test {
namespace {

class DenseQuadTest : public FormsTest {
 protected:
  SmStatus form_of(SmMatrix* g, const std::vector<double>& s, SmMatrix* r, std::int32_t keep) {
    return fn().qxsmDenseQuad(g, s.data(), r, keep);
  }
  SmMatrix* result() { return build(kSymmetricSparse, kBefore); }
};
INSTANTIATE_BOTH_HOSTS(DenseQuadTest);

Known unpacked(const std::vector<double>& s, std::int64_t n) {
  Known k(n, n);
  for (std::int64_t j = 0; j < n; ++j)
    for (std::int64_t i = 0; i <= j; ++i) k.set_both(i, j, s[at(i + j * (j + 1) / 2)]);
  return k;
}

bool has_entries(const Known& g, std::int64_t row) {
  for (std::int64_t c = 0; c < g.cols(); ++c)
    if (g.has(row, c)) return true;
  return false;
}

// Every pair of rows with entries is stored, whatever its value, and the diagonal.
Known form_of_entries(const Known& g, const Known& s) {
  const Known left = product(g, s);
  Known r(g.rows(), g.rows());
  for (std::int64_t i = 0; i < g.rows(); ++i) {
    r.set(i, i, 0.0);
    for (std::int64_t l = 0; l < g.rows(); ++l) {
      if (!has_entries(g, i) || !has_entries(g, l)) continue;
      double sum = 0.0;
      for (std::int64_t k = 0; k < g.cols(); ++k) sum += g(l, k) * left(i, k);
      r.set_both(i, l, sum);
    }
  }
  return r;
}

TEST_P(DenseQuadTest, every_pair_of_rows_with_entries_is_entered) {
  for (std::uint64_t seed = 0; seed < 20; ++seed) {
    Random random(seed);
    const std::int64_t rows = 1 + random.below(7);
    const std::int64_t cols = 1 + random.below(9);
    const Known known = random_known(random, kGeneralSparse, rows, cols);
    const std::vector<double> s = random.vector(cols * (cols + 1) / 2);
    SmMatrix* g = build(kGeneralSparse, known);
    SmMatrix* r = typed(kSymmetricSparse);
    ASSERT_EQ(form_of(g, s, r, 0), SM_OK);
    EXPECT_EQ(r->state, SM_STATE_CLOSED);
    EXPECT_TRUE(same_entries(read(r), form_of_entries(known, unpacked(s, cols)))) << "seed " << seed;
    EXPECT_TRUE(same_entries(read(g), known));
  }
}

TEST_P(DenseQuadTest, zeros_are_entered_and_closing_drops_none) {
  Known known(3, 2);
  known.set(0, 0, 1.0);
  known.set(2, 1, 1.0);
  SmMatrix* g = build(kGeneralSparse, known);
  SmMatrix* r = typed(kSymmetricSparse);
  ASSERT_EQ(form_of(g, {2.0, 0.0, 1e-200}, r, 0), SM_OK);
  Known want(3, 3);
  want.set(0, 0, 2.0);
  want.set(1, 1, 0.0);
  want.set(2, 2, 1e-200);
  want.set_both(0, 2, 0.0);
  EXPECT_TRUE(same_entries(read(r), want));
}

TEST_P(DenseQuadTest, adds_to_a_kept_result_and_leaves_it_open) {
  Random random(2);
  const Known known = random_known(random, kGeneralSparse, 4, 5);
  const std::vector<double> s = random.vector(15);
  const Known form = form_of_entries(known, unpacked(s, 5));
  for (const std::int32_t keep : {1, -1, 0x10000}) {
    SmMatrix* g = build(kGeneralSparse, known);
    SmMatrix* r = sized(kSymmetricSparse, 4);
    ASSERT_EQ(form_of(g, s, r, keep), SM_OK);
    ASSERT_EQ(form_of(g, s, r, keep), SM_OK);
    EXPECT_EQ(r->state, SM_STATE_OPEN);
    EXPECT_TRUE(same(read(r), sum(form, form)));
    SmMatrix* small = sized(kSymmetricSparse, 1);
    ASSERT_EQ(form_of(g, s, small, keep), SM_OK);
    EXPECT_TRUE(same(read(small), form));
    SmMatrix* unsized = typed(kSymmetricSparse);
    ASSERT_EQ(form_of(g, s, unsized, keep), SM_OK);
    EXPECT_EQ(unsized->nnz, 0);
  }
}

TEST_P(DenseQuadTest, infinities_and_nans_are_entered) {
  Known known(2, 2);
  known.set(0, 0, kInfinity);
  known.set(1, 1, 1.0);
  SmMatrix* r = typed(kSymmetricSparse);
  ASSERT_EQ(form_of(build(kGeneralSparse, known), {1.0, 0.0, 4.0}, r, 0), SM_OK);
  EXPECT_EQ(read(r)(0, 0), kInfinity);
  EXPECT_TRUE(std::isnan(read(r)(0, 1)));  // 0 times an infinity
  EXPECT_TRUE(read(r).has(0, 1));
  EXPECT_EQ(read(r)(1, 1), 4.0);
  known.set(0, 0, 0.0);
  ASSERT_EQ(form_of(build(kGeneralSparse, known), {1.0, kNan, 4.0}, r, 0), SM_OK);
  EXPECT_EQ(read(r)(0, 0), 0.0);
  EXPECT_TRUE(std::isnan(read(r)(0, 1)));  // a stored zero of G met the NaN of S
  EXPECT_EQ(read(r)(1, 1), 4.0);
}

TEST_P(DenseQuadTest, a_g_with_dense_values_answers_0_silently_before_everything) {
  std::vector<double> data(16, 1.0);
  for (const Shape shape : kDense)
    for (const std::int32_t keep : {0, 1}) {
      SCOPED_TRACE(name_of(shape));
      SmMatrix* r = result();
      SmMatrix* closed = of({shape}, 4, 4);
      SmMatrix* open = new_open_tied(session(), data, 4, 4, shape.kind, shape.format);
      for (SmMatrix* g : {closed, open}) {
        const Known before = read(g);
        EXPECT_EQ(form_of(g, data, r, keep), SM_OK);
        EXPECT_EQ(form_of(g, data, g, keep), SM_OK);
        EXPECT_EQ(form_of(g, data, new_untyped(session()), keep), SM_OK);
        EXPECT_TRUE(same_entries(read(g), before));
      }
      EXPECT_TRUE(as_before(r));
    }
}

TEST_P(DenseQuadTest, a_count_of_dense_values_that_is_a_nan_answers_0_silently) {
  SmMatrix* r = result();
  SmMatrix* g = typed(kGeneralRows);  // neither values nor closed
  g->value_count = kNan;
  EXPECT_EQ(form_of(g, {1.0}, g, 0), SM_OK);
  EXPECT_EQ(form_of(g, {1.0}, r, 0), SM_OK);
  EXPECT_TRUE(as_before(r));
  g->value_count = 0.0;
  EXPECT_EQ(form_of(g, {1.0}, r, 0), SM_NOT_CLOSED);
  EXPECT_TRUE(as_before(r));
}

TEST_P(DenseQuadTest, an_open_g_comes_before_a_result_that_is_g) {
  SmMatrix* r = result();
  for (const Shape shape : kShapes) {
    SmMatrix* g = typed(shape);
    EXPECT_EQ(form_of(g, {1.0}, g, 0), SM_NOT_CLOSED) << name_of(shape);
    EXPECT_EQ(form_of(g, {1.0}, r, 0), SM_NOT_CLOSED) << name_of(shape);
  }
  SmMatrix* open = sized(kSymmetricSparse, 2);
  EXPECT_EQ(form_of(open, std::vector<double>(3), open, 0), SM_NOT_CLOSED);
  EXPECT_EQ(form_of(new_untyped(session()), {1.0}, r, 0), SM_NOT_CLOSED);
  EXPECT_TRUE(as_before(r));
}

TEST_P(DenseQuadTest, a_result_that_is_g_comes_before_it_is_sized) {
  for (const std::int32_t keep : {0, 1}) {
    SmMatrix* g = of({kGeneralSparse}, 3, 4);
    const Known before = read(g);
    EXPECT_EQ(form_of(g, std::vector<double>(10, 1.0), g, keep), SM_BAD_ARGUMENT);
    EXPECT_TRUE(same_entries(read(g), before));
    SmMatrix* empty = sized(kGeneralSparse, 3, 4);
    EXPECT_EQ(form_of(empty, std::vector<double>(10, 1.0), empty, keep), SM_BAD_ARGUMENT);
    SmMatrix* symmetric = of({kSymmetricSparse}, 3, 3);
    EXPECT_EQ(form_of(symmetric, std::vector<double>(6, 1.0), symmetric, keep), SM_BAD_ARGUMENT);
    EXPECT_EQ(symmetric->state, SM_STATE_CLOSED);
  }
}

TEST_P(DenseQuadTest, sizing_that_fails_is_the_answer) {
  SmMatrix* g = of({kGeneralSparse}, 3, 4);
  const std::vector<double> s(10, 1.0);
  EXPECT_EQ(form_of(g, s, new_untyped(session()), 0), SM_UNTYPED);
  EXPECT_EQ(form_of(sized(kGeneralSparse, 3, 4), s, new_untyped(session()), 0), SM_UNTYPED);
  for (const Shape shape : {kSymmetricSparse, kSymmetricRows, kGeneralRows}) {
    SmMatrix* r = typed(shape);
    host().fail_request(0, false);
    EXPECT_EQ(form_of(g, s, r, 0), SM_NO_MEMORY) << name_of(shape);
    EXPECT_EQ(host().stop_failing(), 1);
  }
}

TEST_P(DenseQuadTest, a_g_without_entries_gives_a_closed_result_of_zeros) {
  SmMatrix* g = sized(kGeneralSparse, 3, 4);
  const std::vector<double> s(10, 1.0);
  SmMatrix* r = result();
  ASSERT_EQ(form_of(g, s, r, 0), SM_OK);
  EXPECT_EQ(r->state, SM_STATE_CLOSED);
  EXPECT_EQ(r->rows, 3);
  EXPECT_EQ(r->nnz, 3);
  EXPECT_TRUE(same(read(r), Known(3, 3)));
  SmMatrix* kept = sized(kSymmetricSparse, 2);
  ASSERT_EQ(form_of(g, s, kept, 1), SM_OK);
  EXPECT_EQ(kept->state, SM_STATE_OPEN);
  EXPECT_EQ(kept->rows, 2);
}

TEST_P(DenseQuadTest, a_g_without_entries_comes_before_the_kinds) {
  const std::vector<double> s(10, 1.0);
  for (const Shape shape : kShapes) {
    SmMatrix* r = sized(shape, 2);
    EXPECT_EQ(form_of(sized(kGeneralSparse, 3, 4), s, r, 0), SM_OK) << name_of(shape);
    EXPECT_EQ(r->rows, 3);
    EXPECT_EQ(r->state, SM_STATE_CLOSED);
    SmMatrix* kept = sized(shape, 2);
    EXPECT_EQ(form_of(sized(kGeneralSparse, 3, 4), s, kept, 1), SM_OK) << name_of(shape);
    EXPECT_EQ(kept->rows, 2);
  }
}

TEST_P(DenseQuadTest, other_kinds_and_formats_answer_124_with_the_result_sized) {
  const std::vector<double> s(10, 1.0);
  for (const Shape shape : kShapes) {
    if (shape == kSymmetricSparse) continue;
    SmMatrix* r = of({shape}, 2, 2);
    EXPECT_EQ(form_of(of({kGeneralSparse}, 3, 4), s, r, 0), SM_UNAVAILABLE) << name_of(shape);
    EXPECT_EQ(r->rows, 3);
    EXPECT_TRUE(same(read(r), Known(3, 3)));
    SmMatrix* kept = of({shape}, 2, 2);
    const Known before = read(kept);
    EXPECT_EQ(form_of(of({kGeneralSparse}, 3, 4), s, kept, 1), SM_UNAVAILABLE) << name_of(shape);
    EXPECT_TRUE(same_entries(read(kept), before));
  }
  for (std::int32_t state = SM_STATE_CLOSED; state <= SM_STATE_FACTORED; ++state) {
    SmMatrix* r = result();
    EXPECT_EQ(form_of(of({kSymmetricSparse, state}, 4, 4), s, r, 0), SM_UNAVAILABLE);
    EXPECT_EQ(r->rows, 4);
    EXPECT_EQ(r->state, SM_STATE_OPEN);
    SmMatrix* kept = result();
    EXPECT_EQ(form_of(of({kSymmetricSparse, state}, 4, 4), s, kept, 1), SM_UNAVAILABLE);
    EXPECT_TRUE(as_before(kept));
  }
}

TEST_P(DenseQuadTest, a_row_that_no_array_can_hold_answers_105_and_one_that_memory_cannot_101) {
  SmMatrix* g = sized(kGeneralSparse, 2, SM_MAX_ELEMENTS + 1);
  ASSERT_EQ(fn().qxsmassign(g, 1, 0, 0, 1.0), SM_OK);
  SmMatrix* r = result();
  EXPECT_EQ(form_of(g, {1.0}, r, 1), SM_TOO_LARGE);
  EXPECT_TRUE(as_before(r));
  SmMatrix* large = sized(kGeneralSparse, 2, SM_MAX_ELEMENTS / 4);
  ASSERT_EQ(fn().qxsmassign(large, 1, 0, 0, 1.0), SM_OK);
  EXPECT_EQ(form_of(large, {1.0}, r, 1), SM_NO_MEMORY);
  EXPECT_TRUE(as_before(r));
}

TEST_P(DenseQuadTest, an_assignment_that_fails_is_the_answer_and_work_goes_back) {
  SmMatrix* g = of({kGeneralSparse}, 3, 4);
  SmMatrix* r = result();
  const std::int64_t blocks = host().live_blocks();
  EXPECT_EQ(form_of(g, std::vector<double>(10, 1.0), r, 1), SM_ALREADY_CLOSED);
  EXPECT_TRUE(as_before(r));
  EXPECT_EQ(host().live_blocks(), blocks);
}

}  // namespace
}  // namespace sm::test
